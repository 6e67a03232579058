"""Building: every type, every option, and what is kept beside the pixels."""
import os
import resource
import signal

import numpy as np
from osgeo import gdal, osr

from frame import COUNT, REAL, TYPES, ToolTest, geotiff, samples
from pyramid import Pyramid


def halve(pixels):
    """Averages of 2 x 2 cells, integers rounded half away from zero, computed in Python's own
    numbers."""
    height, width, bands = pixels.shape
    cut = pixels[:height // 2 * 2, :width // 2 * 2]
    cells = [cut[y::2, x::2].astype(object) for y in (0, 1) for x in (0, 1)]
    total = cells[0] + cells[1] + cells[2] + cells[3]
    rounded = np.vectorize(lambda v: (v + 2) // 4 if v >= 0 else -((-v + 2) // 4), otypes=[object])
    return rounded(total).astype(pixels.dtype)


class Types(ToolTest):
    def test_every_type_is_stored_unchanged(self):
        for name in TYPES:
            with self.subTest(name):
                pixels = samples(name, 270, 301, 2)
                geotiff(self.path("source.tif"), pixels, name)
                document = self.document("build", "source.tif", "made.pyr", "--overwrite")
                self.assertEqual(document["pixelType"], name)
                made = Pyramid(self.path("made.pyr"))
                self.assertEqual(made.type_name, name)
                np.testing.assert_array_equal(made.read(0), pixels)

    def test_averages_of_integers_are_exact_in_every_width(self):
        for name in ("Byte", "Char", "UInt16", "Int16", "UInt32", "Int32", "UInt64", "Int64"):
            with self.subTest(name):
                pixels = samples(name, 301, 270, 1)
                geotiff(self.path("source.tif"), pixels, name)
                self.good("build", "source.tif", "made.pyr", "--overwrite")
                np.testing.assert_array_equal(Pyramid(self.path("made.pyr")).read(1), halve(pixels))

    def test_the_source_read_through_gdal_is_the_same(self):
        for name in TYPES:
            if name == "Char":  # shown as Int16 here
                continue
            with self.subTest(name):
                geotiff(self.path("source.tif"), samples(name, 100, 80, 3), name)
                self.good("build", "source.tif", "made.pyr", "--overwrite")
                source = gdal.Open(self.path("source.tif")).ReadAsArray()
                made = np.moveaxis(Pyramid(self.path("made.pyr")).read(0), -1, 0)
                np.testing.assert_array_equal(made, source)


class Options(ToolTest):
    def test_the_report(self):
        self.picture()
        report = self.document("build", "picture.tif", "made.pyr")
        self.assertShape(report, {
            "schema": int, "source": str, "file": str, "width": int, "height": int, "bands": int,
            "pixelType": str, "tileOrdering": str, "levelMax": int, "resampling": str,
            "bytes": COUNT, "seconds": REAL})
        self.assertEqual((report["width"], report["height"], report["bands"]), (700, 300, 3))
        self.assertEqual(report["bytes"], len(Pyramid(self.path("made.pyr")).data))

    def test_levels(self):
        self.picture()
        for asked, expected in (("auto", 2), ("0", 0), ("1", 1), ("8", 8)):
            report = self.document("build", "picture.tif", "made.pyr", "--levels", asked,
                                   "--overwrite")
            self.assertEqual(report["levelMax"], expected)
            self.assertEqual(Pyramid(self.path("made.pyr")).level_max, expected)

    def test_nearest_keeps_the_upper_left_sample(self):
        pixels = self.pyramid("made.pyr", "--resampling", "nearest")
        np.testing.assert_array_equal(Pyramid(self.path("made.pyr")).read(1), pixels[::2, ::2])

    def test_minimum_and_maximum(self):
        pixels = self.picture()
        for method, function in (("minimum", np.minimum), ("maximum", np.maximum)):
            self.good("build", "picture.tif", "made.pyr", "--resampling", method, "--overwrite")
            pairs = function(pixels[::2], pixels[1::2])
            np.testing.assert_array_equal(Pyramid(self.path("made.pyr")).read(1),
                                          function(pairs[:, ::2], pairs[:, 1::2]))

    def test_methods_in_any_case_of_letters(self):
        self.picture()
        for word in ("MODE", "Mode", "mode"):
            report = self.document("build", "picture.tif", "made.pyr", "--resampling", word,
                                   "--ordering", "BLOCKED", "--overwrite")
            self.assertEqual((report["resampling"], report["tileOrdering"]), ("mode", "Blocked"))
            verified = self.document("verify", "made.pyr", "--resampling", word)
            self.assertTrue(verified["good"])

    def test_orderings(self):
        pixels = self.picture()
        for word, stored in (("auto", "Blocked"), ("scanline", "Scanline"), ("blocked", "Blocked")):
            self.good("build", "picture.tif", "made.pyr", "--ordering", word, "--overwrite")
            made = Pyramid(self.path("made.pyr"))
            self.assertIn(made.ordering, (stored, "Blocked") if word == "auto" else (stored,))
            np.testing.assert_array_equal(made.read(0), pixels)

    def test_more_than_eight_bands_are_woven(self):
        pixels = samples("UInt16", 600, 530, 9)
        geotiff(self.path("source.tif"), pixels, "UInt16")
        self.good("build", "source.tif", "made.pyr")
        made = Pyramid(self.path("made.pyr"))
        self.assertEqual(made.ordering, "Morton")
        np.testing.assert_array_equal(made.read(0), pixels)
        np.testing.assert_array_equal(made.read(1), halve(pixels))

    def test_bands_are_chosen_and_ordered(self):
        pixels = self.pyramid("made.pyr", "--bands", "3,1")
        np.testing.assert_array_equal(Pyramid(self.path("made.pyr")).read(0), pixels[:, :, [2, 0]])

    def test_samples_without_data_take_no_part(self):
        pixels = np.full((4, 4, 1), 10, np.uint8)
        pixels[0, 0] = pixels[2:, 2:] = 0
        pixels[0, 1] = 40
        geotiff(self.path("source.tif"), pixels)
        self.good("build", "source.tif", "made.pyr", "--nodata", "0", "--levels", "1")
        np.testing.assert_array_equal(Pyramid(self.path("made.pyr")).read(1)[:, :, 0],
                                      [[20, 10], [10, 0]])
        statistics = self.document("info", "made.pyr")["statistics"][0]
        self.assertEqual(statistics["minimum"], 10)

    def test_a_no_data_value_that_the_builder_rounds_is_told(self):
        geotiff(self.path("a.tif"), samples("Int64", 20, 30, 1), "Int64")
        for value, told in ((2**53 + 1, True), (2**53, False), (-7, False)):
            done = self.run_tool("build", "a.tif", "a.pyr", "--overwrite", f"--nodata={value}")
            self.assertEqual((done.returncode, "last digits of the no-data value" in done.stderr),
                             (0, told), done.stderr)

    def test_a_no_data_value_that_no_sample_can_have(self):
        geotiff(self.path("a.tif"), samples("Single", 20, 30, 1), "Single")
        for value in ("1e39", "-1e300"):
            done = self.run_tool("build", "a.tif", "a.pyr", f"--nodata={value}")
            self.assertEqual(done.returncode, 2, done.stderr)
            self.assertIn("no sample of type Single can be " + value, done.stderr)
        done = self.run_tool("build", "a.tif", "a.pyr", "--nodata=-3.4028235e38")
        self.assertEqual(done.returncode, 0, "this one is rounded to the lowest sample")

    def test_no_no_data_value(self):
        geotiff(self.path("source.tif"), np.zeros((4, 4, 1), np.uint8), nodata=0)
        self.good("build", "source.tif", "made.pyr", "--nodata", "none")
        self.assertEqual(self.document("info", "made.pyr")["statistics"][0]["maximum"], 0)
        self.assertEqual(self.files(), ["made.pyr", "source.tif"])

    def test_bins_and_statistics(self):
        geotiff(self.path("source.tif"), samples("Int16", 50, 60, 1), "Int16")
        self.good("build", "source.tif", "made.pyr", "--bins", "16")
        histogram = self.document("info", "made.pyr")["histograms"][0]
        self.assertEqual((histogram["binCount"], sum(histogram["counts"])), (16, 3000))
        self.good("build", "source.tif", "made.pyr", "--no-statistics", "--overwrite")
        self.assertIsNone(Pyramid(self.path("made.pyr")).document())

    def test_threads_and_memory_do_not_change_the_file(self):
        self.picture(height=1100, width=1500)
        made = set()
        for threads, memory in ((1, "256M"), (2, "16M"), (4, "1G"), (2, "12MiB")):
            self.good("build", "picture.tif", "made.pyr", "--threads", threads, "--memory", memory,
                      "--overwrite")
            with open(self.path("made.pyr"), "rb") as file:
                made.add(file.read())
        self.assertEqual(len(made), 1)

    def test_quiet_says_nothing(self):
        self.picture()
        self.assertEqual(self.good("build", "picture.tif", "made.pyr", "--quiet"), "")


class Beside(ToolTest):
    def contents(self):
        found = {}
        for name in self.files():
            with open(self.path(name), "rb") as handle:
                found[name] = handle.read()
        return found

    def test_palettes_are_kept_and_levels_made_by_mode(self):
        colors = [(0, 0, 0, 255), (255, 0, 0, 255), (0, 128, 0, 200)]
        pixels = samples("Byte", 64, 64, 1) % 3
        geotiff(self.path("source.tif"), pixels, colors=colors)
        report = self.document("build", "source.tif", "made.pyr", "--levels", "1")
        self.assertEqual(report["resampling"], "mode")
        palette = self.document("info", "made.pyr")["palettes"][0]
        # The format of the source keeps no alpha.
        self.assertEqual([color[:3] for color in palette["colors"][:3]],
                         [list(color[:3]) for color in colors])

    def test_georeference_descriptions_and_no_data_follow_the_bands(self):
        geotiff(self.path("source.tif"), samples("Int16", 30, 40, 2), "Int16", nodata=-5)
        dataset = gdal.Open(self.path("source.tif"), gdal.GA_Update)
        reference = osr.SpatialReference()
        reference.ImportFromEPSG(32631)
        dataset.SetSpatialRef(reference)
        dataset.SetGeoTransform([500000, 30, 0, 4000000, 0, -30])
        dataset.GetRasterBand(1).SetDescription("red")
        dataset.GetRasterBand(2).SetDescription("infrared")
        dataset = None
        self.good("build", "source.tif", "made.pyr", "--bands", "2,1")
        self.good("export", "made.pyr", "back.tif")
        back = gdal.Open(self.path("back.tif"))
        self.assertEqual(back.GetGeoTransform(), (500000, 30, 0, 4000000, 0, -30))
        self.assertEqual(back.GetSpatialRef().GetAuthorityCode(None), "32631")
        self.assertEqual(back.GetRasterBand(1).GetNoDataValue(), -5)
        self.assertEqual([back.GetRasterBand(n).GetDescription() for n in (1, 2)],
                         ["infrared", "red"])

    def test_the_sidecar_of_the_file_before_does_not_stay(self):
        geotiff(self.path("with.tif"), samples("Byte", 20, 20, 1), nodata=7)
        self.picture("without.tif", 20, 20, 1)
        self.good("build", "with.tif", "made.pyr")
        self.assertIn("made.pyr.aux.xml", self.files())
        self.good("build", "without.tif", "made.pyr", "--overwrite")
        self.assertNotIn("made.pyr.aux.xml", self.files())

    def test_embedded_metadata_go_with_the_file(self):
        geotiff(self.path("source.tif"), samples("Int16", 300, 400, 2), "Int16", nodata=-5)
        dataset = gdal.Open(self.path("source.tif"), gdal.GA_Update)
        dataset.SetGeoTransform([500000, 30, 0, 4000000, 0, -30])
        dataset.GetRasterBand(2).SetDescription("infrared")
        dataset = None
        self.good("build", "source.tif", "plain.pyr", "--bands", "2")
        for words in (["made.pyr"], ["plain.pyr", "--overwrite"]):
            report = self.document("build", "source.tif", *words, "--bands", "2", "--nodata", "-6",
                                   "--embed")
            self.assertEqual(report["bytes"], os.path.getsize(self.path(words[0])))
        self.assertEqual(self.files(), ["made.pyr", "plain.pyr", "source.tif"])
        os.mkdir(self.path("far"))
        os.rename(self.path("made.pyr"), self.path("far/moved.pyr"))
        info = self.document("info", "far/moved.pyr")
        self.assertEqual((info["geoTransform"], info["noData"]),
                         ([500000, 30, 0, 4000000, 0, -30], [-6]))
        self.good("verify", "far/moved.pyr")
        self.good("export", "far/moved.pyr", "back.tif")
        back = gdal.Open(self.path("back.tif"))
        self.assertEqual(back.GetRasterBand(1).GetDescription(), "infrared")

    def test_verify_takes_no_data_values_out_of_the_file(self):
        pixels = samples("Byte", 300, 400, 1)
        pixels[:, :200] = 7
        geotiff(self.path("source.tif"), pixels, nodata=7)
        self.good("build", "source.tif", "made.pyr", "--embed")
        self.good("verify", "made.pyr")
        self.good("build", "source.tif", "made.pyr", "--overwrite")
        os.remove(self.path("made.pyr.aux.xml"))
        self.assertEqual(self.run_tool("verify", "made.pyr").returncode, 3)

    def test_a_disk_that_does_not_take_embedded_metadata_leaves_nothing(self):
        def limit():
            signal.signal(signal.SIGXFSZ, signal.SIG_IGN)
            resource.setrlimit(resource.RLIMIT_FSIZE, (1024000, 1024000))

        self.picture("source.tif", 20, 20, 1)
        dataset = gdal.Open(self.path("source.tif"), gdal.GA_Update)
        dataset.SetMetadata({"LONG": "x" * 1500000})
        dataset = None
        before = self.files()
        done = self.run_tool("build", "source.tif", "made.pyr", "--embed", preexec_fn=limit)
        self.assertEqual((done.returncode, done.stdout), (1, ""), done)
        self.assertRegex(done.stderr, r"^zmcraster: made\.pyr: cannot keep its metadata in the file: "
                                      r"File too large\n$")
        self.assertEqual(self.files(), before)

    def test_a_sidecar_that_is_cut_off_leaves_what_was_there(self):
        def limit():
            signal.signal(signal.SIGXFSZ, signal.SIG_IGN)
            resource.setrlimit(resource.RLIMIT_FSIZE, (1024000, 1024000))

        self.picture("source.tif", 20, 20, 1)
        dataset = gdal.Open(self.path("source.tif"), gdal.GA_Update)
        dataset.SetMetadata({"LONG": "x" * 1500000})
        dataset = None
        geotiff(self.path("before.tif"), samples("Byte", 20, 20, 1), nodata=7)
        for options in ((), ("--overwrite",)):
            with self.subTest(options):
                if options:
                    self.good("build", "before.tif", "made.pyr", *options)
                before = self.contents()
                done = self.run_tool("build", "source.tif", "made.pyr", *options, preexec_fn=limit)
                self.assertEqual((done.returncode, done.stdout), (1, ""), done)
                self.assertRegex(done.stderr, r"^zmcraster: made\.pyr: [^\n]*made\.pyr\.aux\.xml"
                                 r"[^\n]*Unable to save auxiliary information[^\n]*\n$")
                self.assertEqual(self.contents(), before)

    def test_an_incomplete_pyramid_is_no_source(self):
        self.pyramid()
        end = Pyramid(self.path("picture.pyr")).end
        with open(self.path("picture.pyr"), "r+b") as handle:
            handle.truncate(end - 10)
        self.refused(1, "picture.pyr: the pyramid is incomplete, 10 bytes of tiles are missing; "
                     "build it anew", "build", "picture.pyr", "again.pyr", "--quiet")

    def test_a_pyramid_is_a_source_too(self):
        pixels = self.pyramid("first.pyr")
        self.good("build", "first.pyr", "second.pyr")
        np.testing.assert_array_equal(Pyramid(self.path("second.pyr")).read(0), pixels)


class WithoutFlush(ToolTest):
    SYNC = 16

    def synced(self, *options):
        """A build, and how many calls there were that wait for the disk."""
        preload = os.environ.get("ZMC_FILE_FAULTS_LIBRARY")
        if not preload:
            self.skipTest("no library that counts calls")
        done = self.run_tool("build", "picture.tif", "made.pyr", "--overwrite", "--quiet", *options,
                             env={**os.environ, "LD_PRELOAD": preload, "ZMC_FILE_FAULTS_COUNT": self.path("calls"),
                                  "ZMC_FILE_FAULTS": f"{self.SYNC} 0 0 0 0 {self.folder}"})
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        with open(self.path("calls"), encoding="utf-8") as file:
            calls = int(file.read().split()[0])
        os.remove(self.path("calls"))
        with open(self.path("made.pyr"), "rb") as file:
            return calls, file.read()

    def test_the_file_is_the_same_and_is_not_waited_for(self):
        self.picture()
        for options in ((), ("--processes", "2")):
            with self.subTest(options):
                calls, expected = self.synced(*options)
                fewer, content = self.synced(*options, "--no-flush")
                self.assertTrue(content == expected)
                # Neither the file nor the name in its folder; what stands beside it still is.
                self.assertEqual(fewer, calls - 2)
