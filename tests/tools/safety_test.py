"""Whatever happens to a build, the target's name shows the old file or the new one, whole."""
import os
import random
import signal
import subprocess
import time
import unittest

import numpy as np
from osgeo import gdal

from frame import TOOL, ToolTest, geotiff, samples
from pyramid import Pyramid


class Interrupted(ToolTest):
    """A large source, an old target, and signals at random moments."""

    def setUp(self):
        super().setUp()
        dataset = gdal.GetDriverByName("GTiff").Create(
            self.path("large.tif"), 9000, 7000, 3, gdal.GDT_Byte,
            ["TILED=YES", "INTERLEAVE=PIXEL", "SPARSE_OK=TRUE"])
        dataset.GetRasterBand(1).WriteArray(samples("Byte", 512, 512, 1)[:, :, 0], 4000, 4000)
        dataset = None
        self.pyramid("made.pyr")
        self.old = self.content()

    def content(self):
        with open(self.path("made.pyr"), "rb") as file:
            return file.read()

    def start(self):
        return subprocess.Popen([TOOL, "build", "large.tif", "made.pyr", "--overwrite"],
                                cwd=self.folder, stdout=subprocess.PIPE, stderr=subprocess.PIPE,
                                text=True)

    def whole_build(self):
        begin = time.monotonic()
        build = self.start()
        build.communicate()
        self.assertEqual(build.returncode, 0)
        seconds = time.monotonic() - begin
        with open(self.path("made.pyr"), "wb") as file:
            file.write(self.old)
        return seconds

    def test_at_random_moments(self):
        seconds = self.whole_build()
        moments = random.Random(os.getpid())
        stopped = 0
        for number in range(12):
            kind = (signal.SIGINT, signal.SIGTERM)[number % 2]
            build = self.start()
            time.sleep(moments.uniform(0.1, 0.9) * seconds)
            build.send_signal(kind)
            out, err = build.communicate(timeout=120)
            if build.returncode == 0:
                with open(self.path("made.pyr"), "wb") as file:
                    file.write(self.old)
                continue
            # Before the program has set itself up a signal ends it as it ends any other.
            if build.returncode == -kind:
                self.assertEqual(self.content(), self.old)
                continue
            stopped += 1
            self.assertEqual((build.returncode, out, err),
                             (130, "", "zmcraster: made.pyr: interrupted\n"))
            self.assertEqual(self.content(), self.old)
            self.assertEqual(self.files(), ["large.tif", "made.pyr", "picture.tif"])
        self.assertGreater(stopped, 0)

    def test_killed(self):
        build = self.start()
        deadline = time.monotonic() + 60
        while not [name for name in self.files() if ".zmcbuild-" in name]:
            self.assertLess(time.monotonic(), deadline)
            time.sleep(0.001)
        build.kill()
        build.communicate()
        self.assertEqual(self.content(), self.old)
        left = [name for name in self.files() if ".zmcbuild-" in name]
        self.assertEqual(len(left), 1)
        self.good("build", "picture.tif", "made.pyr", "--overwrite", "--quiet")
        self.assertEqual(self.files(), ["large.tif", "made.pyr", "picture.tif"])

    def test_other_commands(self):
        self.good("build", "large.tif", "large.pyr")
        for command in (["hash", "large.pyr"], ["verify", "large.pyr"],
                        ["compare", "large.tif", "large.pyr"],
                        ["export", "large.pyr", "back.tif"]):
            child = subprocess.Popen([TOOL, *command], cwd=self.folder, stdout=subprocess.PIPE,
                                     stderr=subprocess.PIPE, text=True)
            time.sleep(0.12)
            child.send_signal(signal.SIGINT)
            out, err = child.communicate(timeout=120)
            self.assertIn(child.returncode, (0, 130, -signal.SIGINT), (command, out, err))
            if child.returncode == 130:
                self.assertRegex(err, r"^zmcraster: [a-z.]+: interrupted\n$")
                self.assertNotIn("back.tif", self.files())


class Sources(ToolTest):
    def test_a_source_that_ends_in_the_middle(self):
        geotiff(self.path("cut.tif"), samples("UInt16", 1500, 1500, 2), "UInt16")
        os.truncate(self.path("cut.tif"), os.path.getsize(self.path("cut.tif")) * 2 // 3)
        self.pyramid("made.pyr")
        with open(self.path("made.pyr"), "rb") as file:
            old = file.read()
        done = self.run_tool("build", "cut.tif", "made.pyr", "--overwrite")
        self.assertEqual((done.returncode, done.stdout), (1, ""))
        self.assertRegex(done.stderr.splitlines()[-1], r"^zmcraster: cut\.tif: ")
        with open(self.path("made.pyr"), "rb") as file:
            self.assertEqual(file.read(), old)
        self.assertEqual(self.files(), ["cut.tif", "made.pyr", "picture.tif"])

    def test_damage_inside_compressed_data(self):
        geotiff(self.path("bad.tif"), samples("Byte", 600, 600, 1), options=["COMPRESS=DEFLATE"])
        with open(self.path("bad.tif"), "r+b") as file:
            file.seek(os.path.getsize(self.path("bad.tif")) // 2)
            file.write(bytes(2000))
        done = self.run_tool("build", "bad.tif", "made.pyr")
        self.assertEqual(done.returncode, 1, done)
        self.assertEqual(self.files(), ["bad.tif"])


@unittest.skipUnless(os.geteuid() == 0, "only root mounts a small disk")
class FullDisk(ToolTest):
    def setUp(self):
        super().setUp()
        os.mkdir(self.path("disk"))
        mounted = subprocess.run(["mount", "-t", "tmpfs", "-o", "size=3m", "tmpfs",
                                  self.path("disk")], capture_output=True)
        if mounted.returncode != 0:
            self.skipTest("no disk can be mounted here")
        self.addCleanup(subprocess.run, ["umount", self.path("disk")])

    def test_a_build_that_does_not_fit(self):
        self.picture("small.tif", 100, 100, 1)
        self.good("build", "small.tif", "disk/made.pyr")
        with open(self.path("disk/made.pyr"), "rb") as file:
            old = file.read()
        self.picture("large.tif", 1200, 1200, 3)
        done = self.run_tool("build", "large.tif", "disk/made.pyr", "--overwrite")
        self.assertEqual((done.returncode, done.stdout), (1, ""))
        self.assertRegex(done.stderr, r"^zmcraster: disk/made\.pyr: cannot build it: it needs \d+ "
                                      r"bytes of disk space, and \d+ bytes are free\n$")
        with open(self.path("disk/made.pyr"), "rb") as file:
            self.assertEqual(file.read(), old)
        self.assertEqual(os.listdir(self.path("disk")), ["made.pyr"])

    def test_an_export_that_does_not_fit(self):
        self.picture("large.tif", 1200, 1200, 3)
        self.good("build", "large.tif", "made.pyr")
        done = self.run_tool("export", "made.pyr", "disk/back.tif")
        self.assertEqual((done.returncode, done.stdout), (1, ""))
        self.assertRegex(done.stderr.splitlines()[-1], r"^zmcraster: disk/back\.tif: ")
        self.assertEqual(os.listdir(self.path("disk")), [])
