"""Builds by several processes of one command, held against builds by one."""
import os
import signal
import subprocess
import time

from frame import TOOL
from parts import PartsTest, drawn


class Processes(PartsTest):
    def test_the_file_is_that_of_one_process(self):
        for name, bands in drawn((("Byte", 3), ("Single", 1), ("Double", 9), ("ComplexSingle", 1)), 2):
            self.source(name, 1500, 900, bands)
            expected = self.expected()
            for number in drawn((1, 2, 5), 2):
                with self.subTest((name, number)):
                    self.good("build", "source.tif", "made.pyr", "--processes", number,
                              "--overwrite")
                    self.assertFinished(expected)

    def test_the_report_is_that_of_one_process(self):
        self.source("Byte")
        one = self.document("build", "source.tif", "a.pyr")
        two = self.document("build", "source.tif", "a.pyr", "--processes", "2", "--overwrite")
        for each in one, two:
            del each["seconds"]
        self.assertEqual(one, two)

    def test_what_goes_wrong_is_told_in_one_line_and_leaves_nothing(self):
        self.source("Byte", 3000, 500)
        with open(self.path("source.tif"), "r+b") as file:
            file.truncate(700000)
        before = self.files()
        done = self.run_tool("build", "source.tif", "made.pyr", "--processes", "2")
        self.assertEqual((done.returncode, done.stdout), (1, ""), done)
        self.assertRegex(done.stderr, r"^zmcraster: source\.tif: cannot read lines from [^\n]*\n$")
        self.assertEqual(self.files(), before)

    def slow(self):
        """A source of ten parts that take some time, and what build makes of it."""
        self.source("Double", 5000, 1000)
        return self.expected("--resampling", "lanczos")

    def children(self, parent):
        with open(f"/proc/{parent}/task/{parent}/children") as file:
            return [int(word) for word in file.read().split()]

    def started(self):
        """A build, with its two processes, at work."""
        build = subprocess.Popen([TOOL, "build", "source.tif", "made.pyr", "--processes", "2",
                                  "--resampling", "lanczos"], cwd=self.folder,
                                 stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True)
        while len(children := self.children(build.pid)) < 2 or not self.any_record():
            self.assertIsNone(build.poll(), "it is too quick for this test")
            time.sleep(0.002)
        return build, children

    def any_record(self):
        return any(os.listdir(self.path(name)) for name in self.hidden() if name.endswith(".parts"))

    def test_children_that_are_killed_are_made_up_for(self):
        expected = self.slow()
        build, children = self.started()
        for child in children:
            os.kill(child, signal.SIGKILL)
        _, errors = build.communicate(timeout=300)
        self.assertEqual((build.returncode, errors), (0, ""))
        self.assertFinished(expected)

    def test_an_interruption_ends_all_and_leaves_nothing(self):
        self.slow()
        before = self.files()
        build, children = self.started()
        build.send_signal(signal.SIGINT)
        output, errors = build.communicate(timeout=60)
        self.assertEqual((build.returncode, output, errors),
                         (130, "", "zmcraster: made.pyr: interrupted\n"))
        self.assertEqual([child for child in children if os.path.exists(f"/proc/{child}")], [])
        self.assertEqual(self.files(), before)

    def test_what_a_killed_build_leaves_goes_with_the_next(self):
        expected = self.slow()
        build, children = self.started()
        build.kill()
        build.communicate()
        self.assertNotEqual(self.hidden(), [])
        for _ in range(300):
            if not any(os.path.exists(f"/proc/{child}") for child in children):
                break
            time.sleep(0.1)
        self.assertEqual([child for child in children if os.path.exists(f"/proc/{child}")], [],
                         "without a parent they end")
        self.good("build", "source.tif", "made.pyr", "--resampling", "lanczos")
        self.assertFinished(expected)
