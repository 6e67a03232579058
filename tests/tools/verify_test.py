"""Verification finds what was damaged, and nothing else."""
import numpy as np

from frame import TYPES, ToolTest, geotiff, samples
from pyramid import Pyramid

CHECKS = ["structure", "completeness", "documents", "statistics", "levels"]


class Verify(ToolTest):
    def results(self, *arguments, status=0):
        document = self.document("verify", *arguments, status=status)
        self.assertEqual(document["good"], status == 0)
        for check in document["checks"]:
            keys = set(check) - {"reason"}
            self.assertEqual(keys, {"check", "result", "problems"})
            self.assertEqual(bool(check["problems"]), check["result"] == "differs")
        return {check["check"]: check for check in document["checks"]}

    def differing(self, *arguments):
        results = self.results(*arguments, status=3)
        return [name for name in results if results[name]["result"] == "differs"]

    def poke(self, name, offset, size=1):
        with open(self.path(name), "r+b") as file:
            file.seek(offset)
            old = file.read(size)
            file.seek(offset)
            file.write(bytes(byte ^ 0x15 for byte in old))

    def test_every_type_is_good(self):
        for name in TYPES:
            with self.subTest(name):
                geotiff(self.path("source.tif"), samples(name, 530, 300, 2), name)
                self.good("build", "source.tif", "made.pyr", "--overwrite")
                self.assertEqual(list(self.results("made.pyr", "--against", "source.tif")),
                                 CHECKS + ["source"])

    def test_every_method_is_made_again(self):
        geotiff(self.path("source.tif"), samples("Int16", 1100, 700, 2), "Int16", nodata=77)
        for method in ("nearest", "average", "rms", "mode", "minimum", "maximum", "median",
                       "bilinear", "cubic", "lanczos", "gauss", "cubicspline"):
            with self.subTest(method):
                self.good("build", "source.tif", "made.pyr", "--resampling", method, "--overwrite")
                self.results("made.pyr", "--resampling", method)
                other = "average" if method != "average" else "nearest"
                self.assertEqual(self.differing("made.pyr", "--resampling", other), ["levels"])

    def test_kernels_across_blocks(self):
        geotiff(self.path("source.tif"), samples("Byte", 2200, 2300, 8))
        self.good("build", "source.tif", "made.pyr", "--resampling", "lanczos")
        self.results("made.pyr", "--resampling", "lanczos")

    def test_a_sample_of_a_coarse_level(self):
        self.pyramid()
        self.poke("picture.pyr", Pyramid(self.path("picture.pyr")).offset(2) + 3 * 10 + 1)
        self.assertEqual(self.differing("picture.pyr"), ["levels"])
        done = self.run_tool("verify", "picture.pyr")
        self.assertIn("level 2, band 2: 1 samples are not what average makes of level 1, first at "
                      "10,0", done.stdout)

    def test_a_sample_of_the_finest_level(self):
        self.pyramid()
        self.poke("picture.pyr", Pyramid(self.path("picture.pyr")).offset(0) + 7)
        self.assertEqual(self.differing("picture.pyr", "--against", "picture.tif"),
                         ["statistics", "levels", "source"])

    def test_threads_find_the_same(self):
        geotiff(self.path("source.tif"), samples("Byte", 1500, 1400, 3), nodata=9)
        self.good("build", "source.tif", "made.pyr")
        file = Pyramid(self.path("made.pyr"))
        good = self.document("verify", "made.pyr", "--threads", "1")
        self.assertEqual(self.document("verify", "made.pyr", "--threads", "3"), good)
        for pixel in (600 * 256 + 40, 7, 500000, 1200000):  # of level 0, in several blocks
            self.poke("made.pyr", file.offset(0) + 3 * pixel + 1)
        self.poke("made.pyr", file.offset(1) + 3 * 300000)
        alone = self.run_tool("verify", "made.pyr", "--threads", "1")
        self.assertEqual(alone.returncode, 3)
        self.assertIn("level 1, band 2: 4 samples are not what average", alone.stdout)
        for threads in ("2", "5"):
            together = self.run_tool("verify", "made.pyr", "--threads", threads)
            self.assertEqual(together.stdout, alone.stdout)

    def test_statistics(self):
        self.pyramid()
        file = Pyramid(self.path("picture.pyr"))
        at = file.data.index(b"<RSTC_MEAN>", file.end) + len("<RSTC_MEAN>")
        with open(self.path("picture.pyr"), "r+b") as handle:
            handle.seek(at)
            handle.write(b"9")
        self.assertEqual(self.differing("picture.pyr"), ["statistics"])

    def test_a_count_of_a_histogram(self):
        self.pyramid()
        file = Pyramid(self.path("picture.pyr"))
        at = file.data.index(b"<HIST_COUNTS>", file.end) + len("<HIST_COUNTS>")
        with open(self.path("picture.pyr"), "r+b") as handle:
            handle.seek(at)
            handle.write(b"1" if file.data[at:at + 1] != b"1" else b"2")
        self.assertEqual(self.differing("picture.pyr"), ["statistics"])

    def test_a_malformed_document(self):
        self.pyramid()
        file = Pyramid(self.path("picture.pyr"))
        with open(self.path("picture.pyr"), "r+b") as handle:
            handle.truncate(len(file.data) - 20)
        self.assertEqual(self.differing("picture.pyr"), ["documents"])

    def test_an_incomplete_file(self):
        self.pyramid()
        with open(self.path("picture.pyr"), "r+b") as handle:
            handle.truncate(Pyramid(self.path("picture.pyr")).end - 5)
        results = self.results("picture.pyr", status=3)
        self.assertEqual(results["completeness"]["problems"],
                         ["5 bytes of tiles are missing; build the file anew"])
        self.assertEqual(results["levels"]["result"], "skipped")

    def test_chosen_bands_of_the_source(self):
        self.pyramid("made.pyr", "--bands", "3,1")
        self.results("made.pyr", "--against", "picture.tif", "--bands", "3,1")
        self.assertEqual(self.differing("made.pyr", "--against", "picture.tif"), ["source"])
        self.assertEqual(self.differing("made.pyr", "--against", "picture.tif", "--bands", "1,3"),
                         ["source"])

    def test_palettes_mean_mode(self):
        geotiff(self.path("source.tif"), samples("Byte", 700, 300, 1) % 4,
                colors=[(0, 0, 0, 255)] * 4)
        self.good("build", "source.tif", "made.pyr")
        self.results("made.pyr")

    def test_no_data_by_the_command_line(self):
        self.pyramid("made.pyr", "--nodata", "3")
        self.results("made.pyr")

    def test_values_that_are_not_finite(self):
        pixels = samples("Single", 300, 300, 1)
        pixels[5, 5], pixels[6:20, 6:20] = np.inf, np.nan
        geotiff(self.path("source.tif"), pixels, "Single")
        self.good("build", "source.tif", "made.pyr")
        self.results("made.pyr", "--against", "source.tif")
