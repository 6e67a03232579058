"""Statistics whose store was cut off are put back, or said to be damaged."""
import json
import os
import struct
import subprocess
import time
import unittest

from frame import TOOL, ToolTest
from pyramid import Pyramid

MARK = b"\x1a"  # stands for the first byte of a document while it is stored


def checksum(data):
    total = 0xCBF29CE484222325
    for byte in data:
        total = (total ^ byte) * 0x100000001B3 & 0xFFFFFFFFFFFFFFFF
    return total


def boot():
    with open("/proc/sys/kernel/random/boot_id", "rb") as file:
        return file.read().strip()


class Recover(ToolTest):
    def setUp(self):
        super().setUp()
        self.pyramid()
        self.file = self.path("picture.pyr")
        self.copy = self.file + ".zmcmeta"
        self.good_file = Pyramid(self.file)

    def leave_copy(self, run=None, whole=None):
        """What a store leaves that is cut off before its first write, into `whole` if given."""
        file = self.good_file
        run = boot() if run is None else run
        text = (whole or file.data)[file.end:]
        data = b"ZMCMETA1" + struct.pack(
            "<7Q", file.end, len(file.data), os.stat(self.file).st_ino, file.start,
            checksum(file.data[:file.start]), len(run), len(text)) + run + text
        with open(self.copy, "wb") as copy:
            copy.write(data + struct.pack("<Q", checksum(data)))

    def damage(self):
        with open(self.file, "r+b") as file:
            file.seek(self.good_file.end)
            file.write(MARK)

    def bytes(self):
        with open(self.file, "rb") as file:
            return file.read()

    def test_a_copy_is_put_back(self):
        self.leave_copy()
        self.damage()
        self.assertEqual(self.good("recover", "picture.pyr"),
                         "picture.pyr: a store into it did not end; its metadata document is again "
                         "the one of before\n")
        self.assertEqual(self.bytes(), self.good_file.data)
        self.assertEqual(self.files(), ["picture.pyr", "picture.tif"])
        self.assertEqual(self.good("recover", "picture.pyr"),
                         "picture.pyr: there is nothing to recover\n")

    def test_documents(self):
        self.leave_copy()
        self.damage()
        shape = {"schema": int, "file": str, "result": str, "text": str}
        for result in "restored", "nothing":
            document = self.document("recover", "picture.pyr")
            self.assertShape(document, shape)
            self.assertEqual(document["result"], result)
        self.leave_copy()
        self.assertEqual(self.document("recover", "picture.pyr")["result"], "complete")
        self.damage()
        self.assertEqual(self.document("recover", "picture.pyr", "--discard")["result"],
                         "discarded")

    def test_after_a_new_start_of_the_system(self):
        self.leave_copy(b"another start")
        file = self.bytes()
        with open(self.file, "wb") as changed:
            changed.write(file.replace(b"<RSTC_MEAN>1", b"<RSTC_MEAN>9"))
        self.assertNotEqual(self.bytes(), file)
        self.assertEqual(self.document("recover", "picture.pyr")["result"], "restored")
        self.assertEqual(self.bytes(), file)

    def reading_commands(self):
        """Every command that is asked to look, with its status where statistics are damaged."""
        return ((["info", "picture.pyr"], 0), (["hash", "picture.pyr"], 0),
                (["verify", "picture.pyr"], 3), (["compare", "picture.pyr", "picture.tif"], 0),
                (["export", "picture.pyr", "out.png", "--quiet"], 0),
                (["build", "picture.pyr", "other.pyr", "--overwrite"], 0))

    def test_commands_that_read_leave_file_and_copy_alone(self):
        self.leave_copy()
        self.damage()
        damaged = self.bytes()
        with open(self.copy, "rb") as copy:
            kept = copy.read()
        for command, status in self.reading_commands():
            with self.subTest(command[0]):
                before = os.stat(self.file)
                done = self.run_tool(*command)
                self.assertEqual(done.returncode, status, done)
                if "--quiet" not in command:
                    self.assertEqual(done.stderr.count(
                        "zmcraster: picture.pyr: warning: a store into it did not end; zmcraster "
                        "recover puts its metadata document in order\n"), 1, done)
                self.assertEqual(self.bytes(), damaged)
                self.assertEqual(os.stat(self.file).st_mtime_ns, before.st_mtime_ns)
                with open(self.copy, "rb") as copy:
                    self.assertEqual(copy.read(), kept)
        self.good("recover", "picture.pyr")
        self.assertEqual(self.bytes(), self.good_file.data)

    @unittest.skipUnless(os.geteuid() == 0, "only root gives files away")
    def test_a_copy_that_somebody_else_planted_counts_for_nothing(self):
        forged = self.bytes().replace(b"<RSTC_MEAN>1", b"<RSTC_MEAN>9")
        self.assertNotEqual(forged, self.bytes())
        self.leave_copy(b"another start", forged)
        os.chown(self.copy, 65534, 65534)
        text = ("the copy of its metadata document, picture.pyr.zmcmeta, is not used: it belongs to "
                "a user who does not own the file")
        self.refused(1, f"picture.pyr: {text}; --discard removes it", "recover", "picture.pyr")
        for command, _ in self.reading_commands():
            with self.subTest(command[0]):
                self.assertIn(self.run_tool(*command).returncode, (0, 3))
                self.assertEqual(self.bytes(), self.good_file.data)
        # Once the file is that user's, so is the word.
        os.chown(self.file, 65534, 65534)
        self.good("recover", "picture.pyr")
        self.assertEqual(self.bytes(), forged)

    # MiB that the program may take; sanitizers take some themselves.
    MOST = 200 if "ZMC_FILE_FAULTS_LIBRARY" in os.environ else 2000

    def peak(self, *arguments):
        """Runs the program and gives its status, its messages and the most memory in MiB."""
        with open(self.path("err"), "w+") as err:
            child = subprocess.Popen([TOOL, *arguments], cwd=self.folder, stderr=err,
                                     stdout=subprocess.DEVNULL)
            _, status, usage = os.wait4(child.pid, 0)
            child.returncode = os.waitstatus_to_exitcode(status)
            err.seek(0)
            return child.returncode, err.read(), usage.ru_maxrss // 1024

    def test_a_copy_of_six_gibibytes_is_not_read(self):
        self.leave_copy()
        os.truncate(self.copy, 6 << 30)
        text = "picture.pyr: %sthe copy of its metadata document, picture.pyr.zmcmeta, is not used: "
        begin = time.monotonic()
        status, err, most = self.peak("recover", "picture.pyr")
        self.assertEqual((status, err), (1, "zmcraster: " + text % "" + "it is longer than any copy; "
                                            "--discard removes it\n"))
        self.assertLess(most, self.MOST)
        status, err, most = self.peak("hash", "picture.pyr")
        self.assertEqual((status, err), (0, "zmcraster: " + text % "warning: " +
                                         "it is longer than any copy\n"))
        self.assertLess(most, self.MOST)
        os.truncate(self.copy, 200 << 20)
        status, err, most = self.peak("recover", "picture.pyr")
        self.assertEqual((status, err), (1, "zmcraster: " + text % "" + "it is torn; --discard "
                                            "removes it\n"))
        self.assertLess(most, self.MOST)
        self.assertLess(time.monotonic() - begin, 20)

    def test_a_copy_that_is_no_file_of_its_own(self):
        self.leave_copy()
        os.rename(self.copy, self.path("elsewhere"))
        for plant in (lambda: os.mkfifo(self.copy), lambda: os.mkdir(self.copy),
                      lambda: os.symlink("elsewhere", self.copy),
                      lambda: os.symlink("/dev/zero", self.copy)):
            plant()
            done = self.run_tool("recover", "picture.pyr")
            self.assertEqual((done.returncode, done.stderr.count("\n")), (1, 1), done)
            self.assertIn("cannot be opened", done.stderr)
            self.assertEqual(self.run_tool("hash", "picture.pyr").returncode, 0)
            self.assertEqual(self.bytes(), self.good_file.data)
            os.rmdir(self.copy) if os.path.isdir(self.copy) else os.remove(self.copy)

    def test_damage_without_a_copy(self):
        self.damage()
        wrong = "the metadata document is damaged: a store did not end"
        self.refused(1, f"picture.pyr: {wrong}, and there is no copy of the one before; --discard "
                        "removes it", "recover", "picture.pyr")
        done = self.run_tool("info", "picture.pyr", "--json")
        self.assertEqual(done.returncode, 0)
        self.assertEqual(done.stderr, f"zmcraster: picture.pyr: warning: {wrong}; statistics, "
                                      "histograms and palettes are not shown\n")
        self.assertEqual(json.loads(done.stdout)["statistics"], [])
        checks = {check["check"]: check
                  for check in self.document("verify", "picture.pyr", status=3)["checks"]}
        self.assertEqual(checks["documents"]["problems"], [wrong])
        self.assertEqual(checks["statistics"]["result"], "skipped")
        self.assertEqual(checks["levels"]["result"], "good")

    def test_discarding(self):
        self.damage()
        self.assertEqual(self.good("recover", "picture.pyr", "--discard"),
                         "picture.pyr: what was damaged is removed; statistics can be stored anew\n")
        self.assertEqual(self.bytes(), self.good_file.data[:self.good_file.end])
        self.good("verify", "picture.pyr")

    def test_what_is_not_discarded(self):
        why = "picture.pyr: cannot discard its metadata document: "
        self.refused(1, why + "it is not damaged", "recover", "picture.pyr", "--discard")
        self.leave_copy()
        self.damage()
        self.refused(1, why + "there is a copy of it, which can be put back", "recover",
                     "picture.pyr", "--discard")

    def test_a_torn_copy(self):
        self.leave_copy()
        os.truncate(self.copy, os.path.getsize(self.copy) - 1)
        self.damage()
        damaged = self.bytes()
        text = ("picture.pyr: the copy of its metadata document, picture.pyr.zmcmeta, is not used: "
                "it is torn")
        self.refused(1, text + "; --discard removes it", "recover", "picture.pyr")
        done = self.run_tool("verify", "picture.pyr")
        self.assertEqual(done.returncode, 3)
        self.assertEqual(done.stderr, "zmcraster: " + text.replace("pyr:", "pyr: warning:", 1) + "\n")
        self.assertEqual(self.bytes(), damaged)
        self.good("recover", "picture.pyr", "--discard")
        self.assertEqual(self.files(), ["picture.pyr", "picture.tif"])
        self.assertEqual(self.bytes(), self.good_file.data[:self.good_file.end])

    def test_a_copy_of_another_file(self):
        self.leave_copy()
        os.rename(self.file, self.path("old.pyr"))
        self.good("build", "picture.tif", "other.pyr")
        os.rename(self.path("other.pyr"), self.file)
        self.damage()
        self.refused(1, "picture.pyr: the copy of its metadata document, picture.pyr.zmcmeta, is not "
                        "used: it is a copy of another file of that name; --discard removes it",
                     "recover", "picture.pyr")

    def test_a_build_takes_the_copy_of_the_old_file_away(self):
        self.leave_copy()
        self.good("build", "picture.tif", "picture.pyr", "--overwrite")
        self.assertEqual(self.files(), ["picture.pyr", "picture.tif"])

    def test_no_pyramid(self):
        self.refused(1, "none.pyr: there is no such file", "recover", "none.pyr")
        self.refused(1, "picture.tif: cannot read the header: it is no pyramid file", "recover",
                     "picture.tif")
