"""scripts/check-floors on small houses, each with one thing planted in it."""

import pathlib
import subprocess
import sys
import tempfile
import unittest

ROOT = pathlib.Path(__file__).resolve().parents[2]
CHECK = ROOT / "scripts" / "check-floors"


class Floors(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.house = pathlib.Path(folder.name)
        # What is right: downwards, inside a room, the standard library, the system in its place.
        self.write("platform/File.h", "#include <cstdint>")
        self.write("platform/posix/File.cpp", '#include "platform/File.h"', "#include <unistd.h>")
        self.write("core/String.h", '#include "platform/File.h"')
        self.write("core/Array.h", '#include "core/String.h"')
        self.write("zmcg/zmcg.h", '#include "core/String.h"')
        self.write("host/base/Error.h", "#include <string>")
        self.write("host/build/Plan.h", '#include "host/base/Error.h"')
        self.write("pyramid/Dataset.h", '#include "core/Array.h"')
        self.write("tests/core/ArrayTest.cpp", '#include "core/Array.h"', "#include <fcntl.h>")

    def write(self, path, *lines):
        place = self.house / path
        place.parent.mkdir(parents=True, exist_ok=True)
        place.write_text("\n".join(lines) + "\n", encoding="utf-8")

    def check(self, root=None):
        return subprocess.run([sys.executable, "-B", CHECK, "--root", root or self.house],
                              stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True,
                              check=False)

    def refuse(self, *words):
        done = self.check()
        self.assertEqual(done.returncode, 1, done.stdout)
        self.assertEqual(done.stdout.count("\n"), 1, done.stdout)
        for word in words:
            self.assertIn(word, done.stdout)

    def test_a_house_in_order(self):
        done = self.check()
        self.assertEqual(done.returncode, 0, done.stdout)
        self.assertIn("9 files", done.stdout)

    def test_an_include_that_climbs(self):
        self.write("core/Lock.h", "#pragma once", '#include "pyramid/Dataset.h"')
        self.refuse("core/Lock.h:2: core must not include pyramid/Dataset.h, which is in pyramid")

    def test_one_in_angle_brackets(self):
        self.write("core/Lock.h", "#  include <pyramid/Dataset.h>")
        self.refuse("core/Lock.h:1: core must not include pyramid/Dataset.h")

    def test_rooms_inside_a_folder(self):
        self.write("host/base/Text.h", '#include "host/build/Plan.h"')
        self.refuse("host/base must not include host/build/Plan.h, which is in host/build")

    def test_text_stands_below_the_rest_of_its_folder(self):
        self.write("core/WideChar.h", '#include "core/Array.h"')
        self.refuse("text must not include core/Array.h, which is in core")

    def test_the_host_side_sees_the_interface_alone(self):
        self.write("host/build/Peek.cpp", '#include "pyramid/Dataset.h"')
        self.refuse("host/build must not include pyramid/Dataset.h")

    def test_the_house_does_not_lean_on_its_tests(self):
        self.write("tests/support/Model.h")
        self.write("tools/Model.cpp", '#include "tests/support/Model.h"')
        self.refuse("tools must not include tests/support/Model.h, which is in tests")

    def test_a_header_named_from_its_own_folder(self):
        self.write("core/Lock.h", '#include "Array.h"')
        self.refuse("there is no Array.h")

    def test_a_source_in_no_room(self):
        self.write("attic/Old.cpp")
        self.refuse("attic/Old.cpp: in no room")

    def test_a_source_of_the_host_in_no_room(self):
        self.write("host/Loose.h")
        self.refuse("host/Loose.h: in no room")

    def test_system_headers(self):
        for header in ("unistd.h", "fcntl.h", "sys/stat.h", "sys/ioctl.h", "dlfcn.h", "signal.h",
                       "csignal", "poll.h", "pthread.h", "linux/fs.h"):
            with self.subTest(header):
                self.write("tools/Message.cpp", f"#include <{header}>")
                self.refuse(f"tools/Message.cpp:1: <{header}> is the system's")

    def test_system_headers_beside_the_folder_of_the_system(self):
        self.write("platform/Lock.h", "#include <fcntl.h>")
        self.refuse("platform/Lock.h:1: <fcntl.h> is the system's")

    def test_system_calls_from_headers_of_the_language(self):
        for call in ("popen(name)", "::realpath(name, nullptr)", "setenv(a, b, 1)"):
            with self.subTest(call):
                self.write("gdal/Create.cpp", f"    auto x = {call};")
                self.refuse("gdal/Create.cpp:1:", "is the system's")
        self.write("gdal/Create.cpp", "// popen() would do.", "file.fileno(); files->popen(x);")
        self.assertEqual(self.check().returncode, 0)

    def test_an_empty_tree_proves_nothing(self):
        with tempfile.TemporaryDirectory() as empty:
            self.assertEqual(self.check(empty).returncode, 1)


class Picture(unittest.TestCase):
    def test_names_every_room(self):
        done = subprocess.run([sys.executable, "-B", CHECK, "--list"], stdout=subprocess.PIPE,
                              text=True, check=True)
        files = [line.strip() for line in done.stdout.splitlines() if line.startswith("    ")]
        folders = {name.split("/")[0] for name in files if not name.startswith("host/")}
        folders |= {"/".join(name.split("/")[:2]) for name in files if name.startswith("host/")}
        self.assertGreater(len(folders), 20)
        text = (ROOT / "docs" / "architecture.md").read_text(encoding="utf-8")
        picture = text.split("```")[1]
        self.assertEqual([each for each in sorted(folders) if each + "/" not in picture], [])


if __name__ == "__main__":
    unittest.main()
