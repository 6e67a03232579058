"""zmcraster update: the result is what build makes of the changed source, and what goes wrong on the
way leaves the old file or the new one."""
import fcntl
import os
import random
import signal
import subprocess
import time

import numpy as np
from osgeo import gdal

from frame import TOOL, ToolTest, geotiff, samples

FULL = os.environ.get("ZMC_CAMPAIGN") == "full"
WINDOW = (530, 40, 300, 500)


class UpdateTest(ToolTest):
    def content(self, name):
        with open(self.path(name), "rb") as file:
            return file.read()

    def result(self, name):
        """A pyramid and what stands beside it."""
        return [self.content(name + end) if os.path.exists(self.path(name + end)) else None
                for end in ("", ".aux.xml", ".msk")]

    def source(self, type_name="Byte", height=1100, width=1400, bands=3, **more):
        self.pixels = samples(type_name, height, width, bands)
        self.type_name, self.more = type_name, more
        geotiff(self.path("source.tif"), self.pixels, type_name, **more)

    def change(self, window=WINDOW, seed=9):
        """Other samples in a window; the text that tells it."""
        x, y, width, height = window
        other = samples(self.type_name, height, width, self.pixels.shape[2], seed)
        self.pixels[y:y + height, x:x + width] = other
        os.remove(self.path("source.tif"))
        geotiff(self.path("source.tif"), self.pixels, self.type_name, **self.more)
        return ",".join(map(str, window))

    def expect_full(self, *options):
        self.good("build", "source.tif", "full.pyr", "--overwrite", *options)
        self.assertTrue(self.result("made.pyr") == self.result("full.pyr"))

    def hidden(self):
        return [name for name in self.files()
                if name.startswith(".") or name.endswith(".zmcupdate")]


class Results(UpdateTest):
    def test_with_records_needs_no_other_words(self):
        for type_name, options in (("Byte", ()), ("UInt16", ("--resampling", "cubic")),
                                   ("Single", ("--nodata", "3", "--bands", "2,1")),
                                   ("Byte", ("--embed",)), ("Int32", ("--no-statistics",))):
            with self.subTest(type_name=type_name, options=options):
                self.source(type_name)
                self.good("build", "source.tif", "made.pyr", "--overwrite", "--keep-records",
                          *options)
                self.good("update", "made.pyr", "--changed", self.change())
                self.expect_full(*options)
                self.good("update", "made.pyr", "--changed", self.change((0, 0, 9, 9)),
                          "--changed", self.change((1399, 1099, 1, 1)))
                self.expect_full(*options)
                self.assertEqual(self.hidden(), [])

    def test_without_records_all_is_told(self):
        self.source("Int16")
        options = ("--resampling", "gauss", "--levels", "3")
        self.good("build", "source.tif", "made.pyr", *options)
        self.good("update", "made.pyr", "source.tif", "--changed", self.change(), *options)
        self.expect_full(*options)
        self.assertFalse(os.path.exists(self.path("made.pyr.zmcrecords")))
        self.good("update", "made.pyr", "source.tif", "--changed", self.change(seed=4), *options,
                  "--keep-records")
        self.expect_full(*options)
        self.good("update", "made.pyr", "--changed", self.change(seed=5))
        self.expect_full(*options)

    def test_document_tells_what_was_done(self):
        self.source()
        self.good("build", "source.tif", "made.pyr", "--keep-records")
        told = self.document("update", "made.pyr", "--changed", self.change((600, 600, 5, 5)))
        self.assertEqual(told["changed"], [[600, 600, 5, 5]])
        self.assertEqual((told["file"], told["tiles"], told["blocks"]), ("made.pyr", 4, 1))

    def test_a_scene_tells_the_window(self):
        self.source()
        place = (500000, 10, 0, 4000000, 0, -10)
        self.more = {}

        def put(name, transform):
            dataset = gdal.Open(self.path(name), gdal.GA_Update)
            dataset.SetGeoTransform(transform)
            dataset = None
        put("source.tif", place)
        self.good("build", "source.tif", "made.pyr", "--keep-records")
        self.change()
        put("source.tif", place)
        x, y, width, height = WINDOW
        geotiff(self.path("scene.tif"), self.pixels[y:y + height, x:x + width])
        put("scene.tif", (500000 + 10 * x, 10, 0, 4000000 - 10 * y, 0, -10))
        told = self.document("update", "made.pyr", "--changed", "scene.tif")
        self.assertEqual(told["changed"], [[x - 1, y - 1, width + 2, height + 2]])
        self.expect_full()
        put("scene.tif", (0, 10, 0, 0, 0, -10))
        self.refused(1, "scene.tif: it does not lie in the source", "update", "made.pyr",
                     "--changed", "scene.tif")

    def test_masks_and_alpha_weigh(self):
        for masked in (True, False):
            with self.subTest(masked=masked):
                self.source(bands=4, options=() if masked else ("ALPHA=YES",))

                def mask(seed):
                    if not masked:
                        return
                    dataset = gdal.Open(self.path("source.tif"), gdal.GA_Update)
                    dataset.CreateMaskBand(gdal.GMF_PER_DATASET)
                    shown = np.random.default_rng(1).integers(0, 2, (1100, 1400)).astype(np.uint8)
                    x, y, width, height = WINDOW
                    shown[y:y + height, x:x + width] = seed
                    dataset.GetRasterBand(1).GetMaskBand().WriteArray(shown * 255)
                    dataset = None
                mask(0)
                self.good("build", "source.tif", "made.pyr", "--overwrite", "--keep-records")
                window = self.change()
                mask(1)
                self.good("update", "made.pyr", "--changed", window)
                self.expect_full()

    def test_colours(self):
        self.source(bands=1, colors=[(i, 255 - i, 0, 255) for i in range(256)])
        self.good("build", "source.tif", "made.pyr", "--keep-records")
        self.good("update", "made.pyr", "--changed", self.change())
        self.expect_full()


class Refusals(UpdateTest):
    def setUp(self):
        super().setUp()
        self.source(height=600, width=700, bands=1)
        self.good("build", "source.tif", "made.pyr", "--keep-records")
        self.before = self.result("made.pyr")

    def no(self, status, message, *arguments):
        self.refused(status, message, "update", *arguments)
        self.assertTrue(self.result("made.pyr") == self.before)
        self.assertEqual(self.hidden(), [])

    def test_windows(self):
        for text in ("1,2,3", "1,2,3,4,5", "a,b,c,d,", "-1,0,5,5", "1.5,0,5,5"):
            told = "X,Y,WIDTH,HEIGHT"
            done = self.run_tool("update", "made.pyr", "--changed=" + text)
            if text == "a,b,c,d,":
                self.assertEqual(done.returncode, 1)
                continue
            self.assertEqual((done.returncode, done.stderr),
                             (2, f'zmcraster: --changed: "{text}" is not {told}\n'))
        for text in ("0,0,0,5", "0,0,5,0", "700,0,1,1", "0,0,701,1", "0,599,1,2",
                     "0,0,99999999999,1"):
            self.no(2, f"--changed: {text} is not inside the level, which has 700 x 600 pixels",
                    "made.pyr", "--changed", text)

    def test_targets(self):
        os.symlink("made.pyr", self.path("link.pyr"))
        self.no(1, "link.pyr: cannot update it: it is a link; name the file that it leads to",
                "link.pyr", "source.tif", "--changed", "0,0,1,1")

    def test_sources(self):
        geotiff(self.path("other.tif"), samples("Byte", 600, 701, 1))
        self.no(1, "other.tif: its size or georeference is not that of made.pyr; build that anew",
                "made.pyr", "other.tif", "--changed", "0,0,1,1")
        self.no(1, "made.pyr: it is the source; name another file", "made.pyr", "made.pyr",
                "--changed", "0,0,1,1")
        geotiff(self.path("other.tif"), samples("Int16", 600, 700, 1), "Int16")
        self.no(1, "made.pyr: cannot build it: its file is laid out for another raster",
                "made.pyr", "other.tif", "--changed", "0,0,1,1")

    def test_records(self):
        path = self.path("made.pyr.zmcrecords")
        records = self.content("made.pyr.zmcrecords")
        start = "made.pyr: cannot use the records of its statistics: "
        for damaged in (b"", records[:-1], records[:40], b"x" + records[1:],
                        records[:-30] + b"q" + records[-29:]):
            with open(path, "wb") as file:
                file.write(damaged)
            self.no(1, start + "they are damaged", "made.pyr", "--changed", "0,0,1,1")
        with open(path, "wb") as file:
            file.write(records)
        now = os.stat(self.path("made.pyr"))
        os.utime(self.path("made.pyr"), ns=(now.st_atime_ns, now.st_mtime_ns + 10**9))
        self.no(1, start + "the file was written to since they were made", "made.pyr",
                "--changed", "0,0,1,1")
        os.remove(path)
        self.no(1, "made.pyr: it has no records; name SOURCE and the options that it was built "
                "with", "made.pyr", "--changed", "0,0,1,1")

    def test_options_without_a_source(self):
        self.no(2, "--bins: without SOURCE the options are those of the build", "made.pyr",
                "--changed", "0,0,1,1", "--bins", "5")

    def test_a_build_drops_the_records_of_the_file_before(self):
        self.good("build", "source.tif", "made.pyr", "--overwrite")
        self.assertFalse(os.path.exists(self.path("made.pyr.zmcrecords")))

    def test_locked(self):
        with open(self.path("made.pyr"), "rb") as file:
            fcntl.flock(file, fcntl.LOCK_EX)
            self.no(1, "made.pyr: cannot update it: another process is updating it", "made.pyr",
                    "--changed", "0,0,1,1")


class Interruptions(UpdateTest):
    """The process is ended, or the disk says no, at calls of the system that are chosen."""

    def setUp(self):
        super().setUp()
        self.preload = os.environ.get("ZMC_FILE_FAULTS_LIBRARY")
        if not self.preload:
            self.skipTest("no library that makes calls fail")
        self.source(height=700, width=1100)
        self.good("build", "source.tif", "made.pyr", "--keep-records")
        self.kept = {name: self.content(name) for name in self.files() if name.startswith("made")}
        self.kept_times = {name: os.stat(self.path(name)).st_mtime_ns for name in self.kept}
        self.old = self.result("made.pyr")
        self.window = self.change((100, 100, 300, 300))
        self.good("build", "source.tif", "full.pyr")
        self.new = self.result("full.pyr")

    def put_back(self):
        for name in self.files():
            if name.startswith((".", "made")):
                os.remove(self.path(name))
        for name, bytes_before in self.kept.items():
            with open(self.path(name), "wb") as file:
                file.write(bytes_before)
            os.utime(self.path(name), ns=(self.kept_times[name],) * 2)

    def faulty(self, calls, n, for_good, action, error):
        return self.run_tool("update", "made.pyr", "--changed", self.window, "--threads", "1",
                             env={**os.environ, "LD_PRELOAD": self.preload,
                                  "ZMC_FILE_FAULTS_COUNT": self.path("calls"),
                                  "ZMC_FILE_FAULTS":
                                      f"{calls} {n} {for_good} {action} {error} {self.folder}"})

    def count(self, calls):
        self.put_back()
        done = self.faulty(calls, 0, 0, 0, 0)
        self.assertEqual(done.returncode, 0, done)
        self.assertTrue(self.result("made.pyr") == self.new)
        return int(self.content("calls").split()[0])

    def chosen(self, points, count):
        every = list(range(1, points + 1))
        return every if FULL else sorted(random.Random(points).sample(every, min(count, points)))

    def test_ended_before_and_within_calls_that_change(self):
        changing = 4 | 8 | 16 | 64 | 128
        points = self.count(changing)
        seen = set()
        for action in (3, 4):
            for n in self.chosen(points, 30):
                with self.subTest(action=action, n=n, of=points):
                    self.put_back()
                    done = self.faulty(changing, n, 0, action, 0)
                    self.assertNotEqual(done.returncode, 0)
                    recovered = self.run_tool("recover", "made.pyr")
                    self.assertEqual(recovered.returncode, 0, recovered)
                    result = self.result("made.pyr")
                    self.assertTrue(result in (self.old, self.new))
                    seen.add(result == self.new)
                    self.good("update", "made.pyr", "--changed", self.window)
                    self.assertTrue(self.result("made.pyr") == self.new)
                    self.assertEqual(self.hidden(), [])
        self.assertEqual(seen, {True, False})

    def test_full_disks(self):
        points = self.count(4 | 8)
        for for_good in (0, 1):
            for n in self.chosen(points, 15):
                with self.subTest(n=n, of=points):
                    self.put_back()
                    done = self.faulty(4 | 8, n, for_good, 0, 28)
                    if done.returncode != 0:
                        self.assertEqual(done.stderr.count("\n"), 1, done.stderr)
                    if not os.path.exists(self.path("made.pyr.zmcupdate")):
                        self.assertTrue(self.result("made.pyr") in (self.old, self.new))
                    self.assertEqual(self.run_tool("recover", "made.pyr").returncode, 0)
                    self.assertTrue(self.result("made.pyr") in (self.old, self.new))

    def test_killed_at_any_moment(self):
        luck = random.Random(3)
        for round_number in range(200 if FULL else 12):
            self.put_back()
            process = subprocess.Popen([TOOL, "update", "made.pyr", "--changed", self.window],
                                       cwd=self.folder, stdout=subprocess.DEVNULL,
                                       stderr=subprocess.DEVNULL)
            time.sleep(luck.uniform(0.01, 0.12))
            process.send_signal(signal.SIGKILL)
            process.wait()
            self.run_tool("recover", "made.pyr")
            self.assertTrue(self.result("made.pyr") in (self.old, self.new), round_number)
            self.good("update", "made.pyr", "--changed", self.window)
            self.assertTrue(self.result("made.pyr") == self.new)
