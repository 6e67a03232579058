"""What is drawn on a terminal, and only there."""
import os
import pty
import re
import subprocess

from osgeo import gdal

from frame import TOOL, ToolTest


class Terminal(ToolTest):
    def setUp(self):
        super().setUp()
        gdal.GetDriverByName("GTiff").Create(self.path("large.tif"), 8000, 6000, 3, gdal.GDT_Byte,
                                             ["TILED=YES", "INTERLEAVE=PIXEL", "SPARSE_OK=TRUE"])

    def record(self, *arguments, streams=(1, 2)):
        """Runs the program with some of its streams on a terminal, and gives what came there."""
        ours, theirs = pty.openpty()
        import fcntl
        import struct
        import termios
        fcntl.ioctl(theirs, termios.TIOCSWINSZ, struct.pack("HHHH", 24, 100, 0, 0))
        choose = {number: theirs if number in streams else subprocess.DEVNULL for number in (1, 2)}
        child = subprocess.Popen([TOOL, *arguments], cwd=self.folder, stdin=subprocess.DEVNULL,
                                 stdout=choose[1], stderr=choose[2])
        os.close(theirs)
        text = b""
        while True:
            try:
                part = os.read(ours, 65536)
            except OSError:
                break
            if not part:
                break
            text += part
        os.close(ours)
        self.assertEqual(child.wait(), 0, text)
        return text.decode()

    def test_a_bar_with_rate_and_time_left(self):
        text = self.record("build", "large.tif", "made.pyr")
        frames = [frame for frame in text.split("\r") if "[" in frame and "%" in frame]
        self.assertGreater(len(frames), 1)
        for frame in frames:
            shown = frame.split("\x1b[K")[0]
            self.assertRegex(shown, r"^made\.pyr \[#*\.*\] +\d+ %(  [\d.]+ Mpixel/s)?"
                                    r"(  \d+:\d\d left)?$")
            self.assertLess(len(shown), 100)
        # The bar is wiped, and the report stands alone on its line.
        self.assertRegex(text.split("\r\x1b[K")[-1], r"^made\.pyr: 8000 x 6000 pixels")

    def test_the_bar_of_processes_is_one(self):
        text = self.record("build", "large.tif", "made.pyr", "--processes", "2")
        shares = [int(share) for share in re.findall(r"\] +(\d+) %", text)]
        self.assertGreater(len(shares), 1)
        self.assertEqual(shares, sorted(shares))
        self.assertRegex(text.split("\r\x1b[K")[-1], r"^made\.pyr: 8000 x 6000 pixels")

    def test_no_bar_when_quiet_or_piped(self):
        self.assertEqual(self.record("build", "large.tif", "made.pyr", "--quiet"), "")
        self.assertNotIn("#", self.record("build", "large.tif", "made.pyr", "--overwrite",
                                          streams=(1,)))
        self.assertNotIn("#", self.good("build", "large.tif", "made.pyr", "--overwrite"))

    def test_the_document_is_alone_on_standard_output(self):
        text = self.record("build", "large.tif", "made.pyr", "--json", streams=(1,))
        self.assertTrue(text.startswith("{"))

    def test_histograms_are_drawn(self):
        self.good("build", "large.tif", "made.pyr")
        self.picture()
        self.good("build", "picture.tif", "picture.pyr")
        self.assertIn("█", self.record("info", "picture.pyr"))
