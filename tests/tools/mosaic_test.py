"""Many rasters as the source of a build: what is made of them, by one process or by many, and what is refused."""
import os
import resource
import time

import numpy as np
from osgeo import gdal, osr

from parts import PLAN, PartsTest

LEFT, TOP, SIDE = 500000.0, 5000000.0, 10.0


def system(code):
    reference = osr.SpatialReference()
    reference.ImportFromEPSG(code)
    return reference.ExportToWkt()


class MosaicTest(PartsTest):
    def setUp(self):
        super().setUp()
        self.random = np.random.default_rng(1)

    def scene(self, name, x, y, pixels, side=SIDE, code=32633, transform=None, nodata=None, kind=gdal.GDT_Byte,
              options=(), alpha=False):
        """A GeoTIFF whose upper left corner is x, y pixels of SIDE from that of all."""
        if pixels.ndim == 2:
            pixels = pixels[None]
        os.makedirs(os.path.dirname(self.path(name)), exist_ok=True)
        dataset = gdal.GetDriverByName("GTiff").Create(self.path(name), pixels.shape[2], pixels.shape[1],
                                                       pixels.shape[0], kind, list(options))
        if transform is None:
            transform = (LEFT + x * SIDE, side, 0, TOP - y * SIDE, 0, -side)
        if transform:
            dataset.SetGeoTransform(transform)
        if code:
            dataset.SetProjection(system(code))
        if alpha:
            dataset.GetRasterBand(pixels.shape[0]).SetColorInterpretation(gdal.GCI_AlphaBand)
        for band in range(pixels.shape[0]):
            if nodata is not None:
                dataset.GetRasterBand(band + 1).SetNoDataValue(nodata)
            dataset.GetRasterBand(band + 1).WriteArray(pixels[band])
        return pixels

    def noise(self, height, width, bands=1, low=1, high=255):
        return self.random.integers(low, high, (bands, height, width), dtype=np.uint8)

    def tiles(self, across, down, width=60, height=50, bands=1, folder="in"):
        """Scenes side by side; the whole of them."""
        whole = self.noise(down * height, across * width, bands)
        for row in range(down):
            for column in range(across):
                x, y = column * width, row * height
                self.scene(f"{folder}/{row:03d}-{column:03d}.tif", x, y, whole[:, y:y + height, x:x + width])
        return whole

    def write_list(self, names, name="list.txt"):
        text = b"".join((n if isinstance(n, bytes) else n.encode()) + b"\n" for n in names)
        with open(self.path(name), "wb") as file:
            file.write(text)

    def level0(self, name="made.pyr", size=None):
        """The samples by way of an export, which is read without the driver."""
        self.good("export", name, "level.tif", "-q")
        dataset = gdal.Open(self.path("level.tif"))
        pixels = dataset.ReadAsArray()
        self.place = dataset.GetGeoTransform()
        self.marks = [dataset.GetRasterBand(i + 1).GetNoDataValue() for i in range(dataset.RasterCount)]
        dataset = None
        os.remove(self.path("level.tif"))
        return pixels if pixels.ndim == 3 else pixels[None]

    def build(self, *words):
        self.good("build", *words, "made.pyr", "--overwrite", "-q")
        return self.level0()

    def assertSame(self, a, b):
        self.assertEqual(a.shape, b.shape)
        self.assertTrue(np.array_equal(a, b), np.argwhere(a != b)[:5])

    def assertPartsMakeIt(self, source, *options, sizes=("256", "512x256")):
        """Plans, parts in any order and processes make the file that build makes."""
        self.good("build", source, "made.pyr", "--overwrite", "-q", *options)
        expected = self.result()
        for name in ("made.pyr", "made.pyr.aux.xml"):
            os.remove(self.path(name))
        for size in sizes:
            parts = self.document("plan", source, "made.pyr", "--part-size", size, *options)["parts"]
            for part in reversed(range(parts)):
                self.good("part", PLAN, part, "-q")
            self.good("finish", PLAN, "-q")
            self.assertFinished(expected)
            for name in ("made.pyr", "made.pyr.aux.xml"):
                os.remove(self.path(name))
        self.good("build", source, "made.pyr", "--processes", "2", "-q", *options)
        self.assertFinished(expected)


class Sources(MosaicTest):
    def test_lists_patterns_and_virtual_rasters_are_one(self):
        whole = self.tiles(5, 4, bands=3)
        names = [f"in/{name}" for name in sorted(os.listdir(self.path("in")))]
        self.write_list(["# names", "", "  ", *names, ""])
        self.assertSame(self.build("@list.txt"), whole)
        self.assertEqual(self.place, (LEFT, SIDE, 0, TOP, 0, -SIDE))
        first = self.result()
        for source in ("in/*.tif", "in/0??-*.tif", f"{self.folder}/in/*"):
            self.build(source)
            self.assertEqual(self.result(), first)
        gdal.BuildVRT(self.path("all.vrt"), [self.path(name) for name in names])
        self.build("all.vrt")
        self.assertEqual(self.result(), first)
        self.assertPartsMakeIt("all.vrt")
        self.assertPartsMakeIt("@list.txt")

    def test_names_are_looked_up_from_the_folder_of_the_list(self):
        whole = self.tiles(2, 1, folder="deep/in")
        self.write_list(["in/000-000.tif", "in/000-001.tif"], "deep/list")
        self.assertSame(self.build("@deep/list"), whole)
        os.chdir("/")
        self.assertSame(self.build("@" + self.path("deep/list")), whole)

    def test_names_of_any_bytes(self):
        one, other = self.noise(40, 50), self.noise(40, 50)
        self.scene("in/a.tif", 0, 0, one)
        self.scene("in/b.tif", 50, 0, other)
        odd = [b"in/ x\xff\x1b[31m*.tif", b"in/#y\r\t.tif"]
        for name, plain in zip(odd, ("in/a.tif", "in/b.tif")):
            os.rename(self.path(plain), os.path.join(self.folder.encode(), name))
        self.write_list(odd)
        whole = np.concatenate([one, other], axis=2)
        self.assertSame(self.build("@list.txt"), whole)
        self.assertSame(self.build("in/*"), whole)

    def test_a_raster_that_has_such_a_name_is_that_raster(self):
        whole = self.noise(40, 50)
        self.scene("@one", 0, 0, whole)
        self.scene("*.tif", 0, 0, whole)
        self.scene("other.tif", 50, 0, whole)
        for source in ("@one", "*.tif"):
            self.assertSame(self.build(source), whole)

    def test_one_scene_alone_needs_no_place(self):
        whole = self.noise(40, 50)
        self.scene("in/a.tif", 0, 0, whole, transform=(), code=0)
        self.write_list(["in/a.tif"])
        self.assertSame(self.build("@list.txt"), whole)
        self.assertSame(self.build("in/*"), whole)

    def test_bad_lists_and_patterns(self):
        self.refused(1, "@no: there is no such list", "build", "@no", "made.pyr")
        self.write_list([], "empty")
        self.write_list(["", "#x", " \t"], "blank")
        for name in ("empty", "blank"):
            self.refused(1, f"@{name}: the list names no raster", "build", f"@{name}", "made.pyr")
        self.write_list([b"a\0b"], "zero")
        self.refused(1, "@zero: it is no list of names", "plan", "@zero", "made.pyr")
        self.refused(1, "@.: the list is not a regular file", "build", "@.", "made.pyr")
        os.mkfifo(self.path("pipe"))
        self.refused(1, "@pipe: the list is not a regular file", "build", "@pipe", "made.pyr")
        self.write_list(["@self", "@self"], "self")
        self.refused(1, "@self: line 1 names a list; a list names rasters", "build", "@self", "made.pyr")
        self.write_list(["itself", "itself"], "itself")
        self.refused(1, f"{self.path('itself')}: cannot take it into the mosaic: it is in no raster format that GDAL "
                     "knows", "build", "@itself", "made.pyr")
        self.refused(1, "no*: no file fits this pattern", "build", "no*", "made.pyr")
        self.assertNotIn("made.pyr", self.files())

    def test_a_million_lines(self):
        with open(self.path("many"), "w", encoding="utf-8") as file:
            file.write("missing.tif\n" * 1000000)
        start = time.monotonic()
        self.refused(1, f"{self.path('missing.tif')}: cannot take it into the mosaic: there is no such file",
                     "build", "@many", "made.pyr")
        self.assertLess(time.monotonic() - start, 60)
        with open(self.path("many"), "a", encoding="utf-8") as file:
            file.write("missing.tif\n" * 100000)
        self.refused(1, "@many: it names more than 1048576 rasters", "build", "@many", "made.pyr")

    def test_bad_options(self):
        self.tiles(2, 1)
        for value in ("0", "-1", "inf", "nan"):
            self.refused(2, "--resolution: a pixel has a side above 0", "build", "in/*", "made.pyr", "--resolution",
                         value)
        done = self.run_tool("build", "in/*", "made.pyr", "--overlap", "most")
        self.assertEqual((done.returncode, done.stderr.count("\n")), (2, 1))


class Overlaps(MosaicTest):
    def layers(self):
        """Three scenes over each other, as arrays of the whole with what is not there as -1."""
        layers = []
        for number, (x, y) in enumerate(((0, 0), (150, 100), (80, 220))):
            pixels = self.noise(300, 400)
            # Scenes need not be stored alike.
            self.scene(f"in/{number}.tif", x, y, pixels,
                       options=("COMPRESS=DEFLATE", "TILED=YES") if number == 1 else ())
            layer = np.full((520, 550), -1, dtype=np.int64)
            layer[y:y + 300, x:x + 400] = pixels[0]
            layers.append(layer)
        return np.stack(layers)

    def test_each_rule_and_parts_of_each(self):
        layers = self.layers()
        there = layers >= 0
        any_there = there.any(axis=0)
        counts = np.maximum(there.sum(axis=0), 1)
        sums = np.where(there, layers, 0).sum(axis=0)
        in_order = np.sort(np.where(there, layers, 1000), axis=0)
        last, first = np.zeros_like(sums), np.zeros_like(sums)
        for layer in layers:
            last = np.where(layer >= 0, layer, last)
        for layer in layers[::-1]:
            first = np.where(layer >= 0, layer, first)
        expected = {"last": last, "first": first, "mean": (2 * sums + counts) // (2 * counts), "min": in_order[0],
                    "max": layers.max(axis=0),
                    "median": np.take_along_axis(in_order, ((counts - 1) // 2)[None], axis=0)[0]}
        for rule, values in expected.items():
            with self.subTest(rule):
                made = self.build("in/*", "--overlap", rule)
                self.assertSame(made[0], np.where(any_there, values, 0).astype(np.uint8))
        self.assertPartsMakeIt("in/*", "--overlap", "median", "--nodata", "0")

    def test_gaps_are_told_or_have_a_value(self):
        self.scene("in/a.tif", 0, 0, self.noise(40, 50))
        self.scene("in/b.tif", 100, 60, self.noise(40, 50))
        done = self.run_tool("build", "in/*", "made.pyr")
        self.assertEqual(done.returncode, 0)
        self.assertEqual(done.stderr, "zmcraster: in/*: warning: there are gaps between its scenes, which are filled "
                         "with 0; --nodata tells another value\n")
        self.assertEqual(self.level0()[0, 0, 75], 0)
        made = self.build("in/*", "--nodata", "255")
        self.assertEqual((made[0, 0, 75], self.marks), (255, [255.0]))
        self.good("build", "in/*", "other.pyr", "--nodata", "0", "-q")

    def test_gaps_of_floating_types_are_no_number(self):
        one = np.full((1, 40, 50), 1.5, dtype=np.float32)
        one[0, 3, 4] = np.nan
        self.scene("in/a.tif", 0, 0, one, kind=gdal.GDT_Float32)
        self.scene("in/b.tif", 0, 60, one * 2, kind=gdal.GDT_Float32)
        self.scene("in/c.tif", 0, 1, np.full((1, 10, 10), 9, dtype=np.float32), kind=gdal.GDT_Float32)
        made = self.build("in/*", "--overlap", "first")
        self.assertTrue(np.isnan(made[0, 50]).all())
        self.assertEqual((made[0, 3, 4], made[0, 2, 2], made[0, 62, 2]), (9, 1.5, 3))

    def test_no_data_masks_and_alpha_are_holes(self):
        below, above = self.noise(60, 80), self.noise(60, 80)
        hole = np.zeros((60, 80), dtype=bool)
        hole[10:30, 20:50] = True
        expected = np.where(hole, below[0], above[0])
        self.scene("in/a.tif", 0, 0, below, nodata=0)
        self.scene("in/b.tif", 0, 0, np.where(hole, 7, np.where(above == 7, 8, above)).astype(np.uint8), nodata=7)
        self.assertSame(self.build("in/*")[0], np.where(hole, below[0], np.where(above[0] == 7, 8, above[0])))
        os.remove(self.path("in/b.tif"))
        for options in (("GDAL_TIFF_INTERNAL_MASK", "YES"), ("GDAL_TIFF_INTERNAL_MASK", "NO")):
            self.scene("in/b.tif", 0, 0, above)
            gdal.SetConfigOption(*options)
            dataset = gdal.Open(self.path("in/b.tif"), gdal.GA_Update)
            dataset.CreateMaskBand(gdal.GMF_PER_DATASET)
            dataset.GetRasterBand(1).GetMaskBand().WriteArray(np.where(hole, 0, 255).astype(np.uint8))
            dataset = None
            gdal.SetConfigOption(options[0], None)
            self.assertSame(self.build("in/*.tif")[0], expected)
            for name in os.listdir(self.path("in")):
                if name.startswith("b.tif"):
                    os.remove(self.path(f"in/{name}"))
        self.scene("in/a.tif", 0, 0, np.concatenate([below, np.full_like(below, 255)]), alpha=True)
        self.scene("in/b.tif", 0, 0, np.concatenate([above, np.where(hole, 0, 200)[None].astype(np.uint8)]), alpha=True)
        made = self.build("in/*")
        self.assertSame(made[0], expected)
        self.assertSame(made[1], np.where(hole, 255, 200).astype(np.uint8))

    def test_the_option_marks_what_has_no_mark(self):
        below, above = self.noise(60, 80), self.noise(60, 80)
        above[0, 5:9, 5:9] = 0
        self.scene("in/a.tif", 0, 0, below)
        self.scene("in/b.tif", 0, 0, above)
        self.assertSame(self.build("in/*")[0], above[0])
        self.assertSame(self.build("in/*", "--nodata", "0")[0], np.where(above[0] == 0, below[0], above[0]))


class Places(MosaicTest):
    def test_scenes_off_the_grid_are_resampled(self):
        base = self.noise(100, 120)
        self.scene("in/a.tif", 0, 0, base)
        coarse = self.noise(30, 40)
        self.scene("in/b.tif", 120, 0, coarse, side=2 * SIDE)
        made = self.build("in/*")
        self.assertSame(made[0, :100, :120], base[0])
        self.assertSame(made[0, :60, 120:200], coarse[0].repeat(2, 0).repeat(2, 1))
        # A third of a pixel aside.
        self.scene("in/b.tif", 120 + 1 / 3, 0, coarse)
        made = self.build("in/*", "--nodata", "0")
        self.assertSame(made[0, :30, 120:160], coarse[0])
        self.assertPartsMakeIt("in/*", "--scene-resampling", "cubic", "--nodata", "0", sizes=("256",))

    def test_resolutions(self):
        self.scene("in/a.tif", 0, 0, self.noise(50, 60), side=2 * SIDE)
        fine = self.noise(80, 100)
        self.scene("in/b.tif", 120, 0, fine)
        self.assertEqual(self.build("in/*").shape, (1, 50, 110))
        self.assertEqual(self.build("in/*", "--resolution", "finest").shape, (1, 100, 220))
        self.assertEqual(self.place[1], SIDE)
        self.assertEqual(self.build("in/*", "--resolution", "40").shape, (1, 25, 55))

    def test_other_systems_and_turned_scenes_are_warped_as_gdal_does(self):
        self.scene("in/a.tif", 0, 0, self.noise(300, 300))
        flat = self.noise(200, 200)
        self.scene("in/b.tif", 0, 0, flat, code=4326, transform=(15.03, 1e-4, 0, 45.16, 0, -1e-4))
        self.scene("in/c.tif", 0, 0, self.noise(150, 150),
                   transform=(LEFT + 1500, 8, 3, TOP - 4000, 3, -8))
        made = self.build("in/*", "--nodata", "0")
        left, top = self.place[0], self.place[3]
        height, width = made.shape[1:]
        expected = np.zeros((height, width), dtype=np.uint8)
        for name in "abc":
            warped = gdal.Warp("", self.path(f"in/{name}.tif"), format="MEM", dstSRS="EPSG:32633", srcNodata=0,
                               dstNodata=0, outputBounds=(left, top - height * SIDE, left + width * SIDE, top),
                               width=width, height=height).ReadAsArray()
            expected = np.where(warped == 0, expected, warped)
        self.assertEqual(made.shape[0], 1)
        # Blocks of another corner may round a pixel the other way.
        self.assertLess(np.mean(made[0] != expected), 0.02)
        self.assertGreater(np.count_nonzero(made[0]), 300 * 300 + 200 * 200)
        self.assertPartsMakeIt("in/*", "--nodata", "0")

    def test_scenes_without_a_place_are_refused(self):
        self.tiles(2, 1)
        self.scene("in/x.tif", 0, 0, self.noise(10, 10), transform=())
        self.refused(1, f"{self.path('in/x.tif')}: cannot take it into the mosaic: it has no georeference", "build",
                     "in/*", "made.pyr")
        self.scene("in/x.tif", 0, 0, self.noise(10, 10), code=0)
        self.refused(1, f"{self.path('in/x.tif')}: cannot take it into the mosaic: it has no coordinate system, and "
                     f"{self.path('in/000-000.tif')} has one", "build", "in/*", "made.pyr")
        self.scene("in/x.tif", 10 ** 11, 0, self.noise(10, 10))
        self.refused(1, f"{self.path('in/x.tif')}: cannot take it into the mosaic: it lies too far from those before "
                     "it", "build", "in/*", "made.pyr")

    def test_scenes_that_differ_are_refused(self):
        self.tiles(2, 1)
        one = self.path("in/000-000.tif")
        self.scene("in/x.tif", 0, 0, self.noise(10, 10, 3))
        self.refused(1, f"{self.path('in/x.tif')}: cannot take it into the mosaic: it has 3 bands, and {one} has 1",
                     "build", "in/*", "made.pyr")
        self.scene("in/x.tif", 0, 0, self.noise(10, 10), kind=gdal.GDT_UInt16)
        self.refused(1, f"{self.path('in/x.tif')}: cannot take it into the mosaic: its samples are of type UInt16, and "
                     f"those of {one} of type Byte", "build", "in/*", "made.pyr")
        os.remove(self.path("in/x.tif"))
        self.scene("wide/a.tif", 0, 0, self.noise(10, 10), kind=gdal.GDT_UInt32)
        self.scene("wide/b.tif", 10.5, 0, self.noise(10, 10), kind=gdal.GDT_UInt32)
        self.good("build", "wide/*", "made.pyr", "-q", "--nodata", "0")


class Broken(MosaicTest):
    def setUp(self):
        super().setUp()
        self.whole = self.tiles(3, 2, width=300, height=300)
        self.bad = self.path("in/000-001.tif")

    def test_a_scene_that_is_missing_or_no_raster_is_named(self):
        names = [f"in/{name}" for name in sorted(os.listdir(self.path("in")))]
        self.write_list(names)
        os.truncate(self.bad, 0)
        message = f"{self.bad}: cannot take it into the mosaic: it is in no raster format that GDAL knows"
        for command in ("build", "plan"):
            self.refused(1, message, command, "@list.txt", "made.pyr")
        os.remove(self.bad)
        self.refused(1, f"{self.bad}: cannot take it into the mosaic: there is no such file", "build", "@list.txt",
                     "made.pyr")
        os.mkfifo(self.bad)
        self.refused(1, f"{self.bad}: cannot take it into the mosaic: it is not a regular file", "build", "@list.txt",
                     "made.pyr")
        self.assertEqual(self.hidden(), [])

    def test_a_scene_that_ends_early_fails_its_parts_by_name(self):
        os.truncate(self.bad, os.path.getsize(self.bad) - 30000)
        done = self.run_tool("build", "in/*", "made.pyr")
        self.assertEqual((done.returncode, done.stderr.count("\n")), (1, 1))
        self.assertIn(self.bad + ": cannot take it into the mosaic: ", done.stderr)
        self.assertEqual((self.hidden(), "made.pyr" in self.files()), ([], False))
        parts = self.document("plan", "in/*", "made.pyr", "--part-size", "256")["parts"]
        failed = []
        for part in range(parts):
            done = self.run_tool("part", PLAN, part)
            if done.returncode:
                self.assertIn(self.bad + ": cannot take it into the mosaic: ", done.stderr)
                failed.append(part)
        self.assertTrue(0 < len(failed) < parts, failed)
        self.assertEqual(self.status()["missing"], failed)

    def test_what_is_broken_may_be_left_out(self):
        os.truncate(self.bad, os.path.getsize(self.bad) - 30000)
        with open(self.path("in/001-000.tif"), "wb") as file:
            file.write(b"no raster")
        expected = self.whole[0].copy()
        expected[:300, 300:600] = 0
        expected[300:, :300] = 0
        done = self.run_tool("build", "in/*", "made.pyr", "--skip-broken", "--nodata", "0", "--json")
        self.assertEqual(done.returncode, 0, done.stderr)
        lines = done.stderr.splitlines()
        self.assertEqual(len(lines), 2, done.stderr)
        self.assertTrue(lines[0].startswith(f"zmcraster: {self.bad}: warning: it was left out: "), lines)
        self.assertIn(f'"{self.bad}"', done.stdout)
        self.assertSame(self.level0()[0], expected)
        made = self.result()
        os.remove(self.path("made.pyr"))
        os.remove(self.path("made.pyr.aux.xml"))
        self.assertEqual(self.run_tool("plan", "in/*", "made.pyr", "--skip-broken", "--nodata", "0").returncode, 0)
        self.good("part", PLAN, "0-" + str(self.status()["parts"] - 1))
        done = self.run_tool("finish", PLAN, "--json")
        self.assertEqual(done.returncode, 0, done.stderr)
        self.assertIn('"skipped": [', done.stdout)
        self.assertEqual(done.stderr.splitlines(), lines)
        self.assertFinished(made)

    def test_all_broken(self):
        for name in os.listdir(self.path("in")):
            os.truncate(self.path(f"in/{name}"), 10)
        done = self.run_tool("build", "in/*", "made.pyr", "--skip-broken")
        self.assertEqual((done.returncode, done.stderr.count("\n")), (1, 1))
        self.assertIn("none of its 6 scenes can be read", done.stderr)

    def test_a_scene_that_changed_is_refused_where_it_is_needed(self):
        parts = self.document("plan", "in/*", "made.pyr", "--part-size", "256")["parts"]
        time.sleep(0.03)
        os.utime(self.bad)
        changed = f"{self.bad}: cannot take it into the mosaic: it changed since the mosaic was planned"
        needed = []
        for part in range(parts):
            done = self.run_tool("part", PLAN, part)
            if done.returncode:
                self.assertTrue(done.stderr.endswith(changed + "\n"), done.stderr)
                needed.append(part)
        self.assertTrue(0 < len(needed) < parts, needed)
        self.assertEqual(self.status()["missing"], needed)

    def test_finish_looks_at_all_scenes(self):
        parts = self.document("plan", "in/*", "made.pyr")["parts"]
        self.good("part", PLAN, f"0-{parts - 1}")
        os.remove(self.bad)
        self.refused(1, f"{self.bad}: cannot take it into the mosaic: it changed since the mosaic was planned",
                     "finish", PLAN)
        self.assertNotIn("made.pyr", self.files())

    def test_what_a_plan_knows_of_scenes_is_looked_at(self):
        self.good("plan", "in/*", "made.pyr", "-q")
        scenes = self.pyramid_path() + ".parts/scenes"
        with open(scenes, "rb") as file:
            kept = file.read()
        for bytes_ in (b"", kept[:-1], kept[:50] + b"x" + kept[51:]):
            with open(scenes, "wb") as file:
                file.write(bytes_)
            self.refused(1, f"{PLAN}: what it knows of the scenes of its source is damaged or gone", "part", PLAN, "0")
        os.remove(scenes)
        self.refused(1, f"{PLAN}: what it knows of the scenes of its source is damaged or gone", "finish", PLAN)
        self.good("finish", PLAN, "--discard")
        self.assertEqual(self.hidden(), [])


class Many(MosaicTest):
    def test_two_thousand_scenes_with_few_descriptors(self):
        whole = self.noise(40 * 30, 50 * 40)
        template = self.path("in/template.tif")
        self.scene("in/template.tif", 0, 0, whole[:, :30, :40])
        for row in range(40):
            for column in range(50):
                self.scene(f"in/{row:02d}{column:02d}.tif", column * 40, row * 30,
                           whole[:, row * 30:row * 30 + 30, column * 40:column * 40 + 40])
        os.remove(template)
        limit = lambda: resource.setrlimit(resource.RLIMIT_NOFILE, (64, 64))
        done = self.run_tool("build", "in/*", "made.pyr", "-q", preexec_fn=limit)
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        self.assertSame(self.level0(), whole)
        made = self.result()
        for words in (("plan", "in/*", "again.pyr", "--part-size", "1024"), ("part", "again.pyr.zmcplan", "0-3"),
                      ("finish", "again.pyr.zmcplan")):
            done = self.run_tool(*words, "-q", preexec_fn=limit)
            self.assertEqual((done.returncode, done.stderr), (0, ""), words)
        self.assertEqual(self.content("again.pyr"), made[0])

    def test_a_part_opens_the_scenes_that_it_touches(self):
        self.tiles(20, 10)
        self.good("plan", "in/*", "made.pyr", "--part-size", "256", "-q")
        # Of the first part, 256 x 256 pixels, these touch 5 x 6.
        for row in range(10):
            for column in range(20):
                if row > 5 or column > 4:
                    os.remove(self.path(f"in/{row:03d}-{column:03d}.tif"))
        self.good("part", PLAN, "0", "-q")
        self.assertEqual(self.status()["done"], 1)


class Updates(MosaicTest):
    """With records an update knows the scenes, and opens those that changed and those that it reads."""

    def setUp(self):
        super().setUp()
        self.tiles(6, 6, 400, 400)
        self.good("build", "in/*.tif", "made.pyr", "--keep-records")

    def change(self, row, column, x=None, y=None):
        x, y = column * 400 if x is None else x, row * 400 if y is None else y
        os.remove(self.path(f"in/{row:03d}-{column:03d}.tif"))
        self.scene(f"in/{row:03d}-{column:03d}.tif", x, y, self.noise(400, 400))

    def expect_full(self, *options):
        self.good("build", "in/*.tif", "full.pyr", "--overwrite", *options)
        for end in ("", ".aux.xml"):
            with open(self.path("made.pyr" + end), "rb") as made, open(self.path("full.pyr" + end), "rb") as full:
                self.assertTrue(made.read() == full.read(), end)

    def expect_refusal(self, words, *arguments):
        done = self.run_tool("update", "made.pyr", *arguments)
        self.assertEqual((done.returncode, done.stdout, done.stderr.count("\n")), (1, "", 1), done)
        self.assertIn(words, done.stderr)

    def test_scenes_far_from_what_changed_are_not_opened(self):
        # The first one neither, though it made the grid.
        far = [self.path("in/000-000.tif"), self.path("in/005-005.tif")]
        kept = []
        for name in far:
            with open(name, "rb") as file:
                kept.append((name, file.read(), os.stat(name)))

        def put(name, content, times):
            with open(name, "wb") as file:
                file.write(content)
            os.utime(name, ns=(times.st_atime_ns, times.st_mtime_ns))
        for name, content, times in kept:
            put(name, b"\0" * len(content), times)
        for row, column in ((1, 3), (3, 1)):
            self.change(row, column)
            self.good("update", "made.pyr", "--changed", f"in/{row:03d}-{column:03d}.tif")
        # Without what the records know of it all are surveyed.
        self.expect_refusal("000-000.tif: ", "in/*.tif", "--changed", "0,0,1,1")
        for each in kept:
            put(*each)
        self.expect_full()

    def test_scenes_that_tell_something_else_make_what_a_survey_makes(self):
        def lies(offset, scale=1):
            return LEFT + (800 + offset) * SIDE, SIDE * scale, 0, TOP - 800 * SIDE, 0, -SIDE * scale
        grid, records = "its size or georeference is not that of made.pyr", "cannot use the records"
        # With what the update is refused, where the whole would be another: by the first's resolution, by the finest.
        cases = {
            "a value that stands for none": ({"nodata": 7}, records, records),
            "a little beside the grid": ({"transform": lies(.003)}, None, None),
            "just near enough to the grid": ({"transform": lies(.008)}, None, None),
            "too far from the grid": ({"transform": lies(.3)}, None, None),
            "pixels a little smaller": ({"transform": lies(0, 1 - 1e-5)}, None, grid),
            "pixels of half the side": ({"transform": lies(0, .5), "size": 800}, None, grid),
            "the rows upwards": ({"transform": (LEFT + 8000, SIDE, 0, TOP - 12000, 0, SIDE)}, None, None),
            "another system": ({"code": 32632}, grid, grid),
        }
        for which, options in ((1, []), (2, ["--resolution", "finest"])):
            for name, case in cases.items():
                change, refusal = dict(case[0]), case[which]
                with self.subTest(name, options=options):
                    self.scene("in/002-002.tif", 800, 800, self.noise(400, 400))
                    self.good("build", "in/*.tif", "made.pyr", "--keep-records", "--overwrite", *options)
                    os.remove(self.path("in/002-002.tif"))
                    size = change.pop("size", 400)
                    self.scene("in/002-002.tif", 800, 800, self.noise(size, size), **change)
                    if refusal:
                        done = self.run_tool("update", "made.pyr", "--changed", "700,700,600,600")
                        self.assertEqual((done.returncode, done.stdout), (1, ""), done)
                        self.assertIn(refusal, done.stderr)
                        continue
                    self.good("update", "made.pyr", "--changed", "700,700,600,600")
                    self.expect_full(*options)

    def test_scenes_that_moved_came_or_are_the_first_are_surveyed_anew(self):
        whole = "0,0,2400,2400"
        self.change(3, 3, 1100, 1250)
        self.good("update", "made.pyr", "--changed", whole)
        self.expect_full()
        self.scene("in/more.tif", 700, 300, self.noise(200, 900))
        self.good("update", "made.pyr", "--changed", "in/more.tif")
        self.expect_full()
        self.change(0, 0)
        self.good("update", "made.pyr", "--changed", "in/000-000.tif")
        self.expect_full()
        os.remove(self.path("in/more.tif"))
        self.good("update", "made.pyr", "--changed", whole)
        self.expect_full()

    def test_scene_that_is_another_raster_now_is_refused(self):
        os.remove(self.path("in/002-002.tif"))
        self.scene("in/002-002.tif", 800, 800, self.noise(400, 400, 2))
        self.expect_refusal("002-002.tif: cannot take it into the mosaic: it has 2 bands", "--changed", "800,800,9,9")

    def test_scene_that_changed_without_a_word_is_read_as_it_is(self):
        self.change(4, 4)
        self.good("update", "made.pyr", "--changed", "1600,1600,400,400")
        self.expect_full()
