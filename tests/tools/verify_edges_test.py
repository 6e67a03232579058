"""Verification of files that no builder of ours made, and of sources that are not the file's."""
import struct

import numpy as np

from frame import ToolTest, geotiff, samples


def record(name, **fields):
    inner = "".join(f"<{key}>{value}</{key}>" for key, value in fields.items())
    return f"<{name}>{inner}</{name}>"


class VerifyEdges(ToolTest):
    def handmade(self, records="", name="made.pyr", **fields):
        """A file of 8 x 8 bytes of value 7, unless the header says otherwise."""
        header = {"VERSION_MAJOR": 1, "VERSION_MINOR": 1, "BANDS": 1, "PIXEL_HEIGHT": 8,
                  "PIXEL_WIDTH": 8, "LEVELMIN": 0, "LEVELMAX": 0, "TILESIZE": 8,
                  "INTERLEAVE": "BIP", "BUILD_METHOD": "Blocked", "PIXEL_TYPE": "Byte", **fields}
        header = {"HEADER_" + key: value for key, value in header.items()}
        front = f"<DATASET>{record('HEADER', **header)}</DATASET>".encode()
        start = 20 + len(front)
        size = sum((header["HEADER_PIXEL_WIDTH"] >> level) * (header["HEADER_PIXEL_HEIGHT"] >> level)
                   for level in range(header["HEADER_LEVELMIN"], header["HEADER_LEVELMAX"] + 1))
        size *= header["HEADER_BANDS"]
        with open(self.path(name), "wb") as file:
            file.write(b"KOBT" + struct.pack("<QQ", start, start + size) + front + b"\7" * size)
            if records:
                file.write(f"<DATASET>{records}</DATASET>".encode())
        return name

    def problems(self, check, *arguments, status=3):
        document = self.document("verify", *arguments, status=status)
        return next(each["problems"] for each in document["checks"] if each["check"] == check)

    def test_a_plain_one_is_good(self):
        self.assertEqual(self.problems("structure", self.handmade(), status=0), [])

    def test_version_1_0_has_no_levels(self):
        problems = self.problems("structure", self.handmade(VERSION_MINOR=0))
        self.assertTrue(any("version 1.0 has no levels" in each for each in problems), problems)

    def test_levels_that_have_shrunk_to_nothing(self):
        name = self.handmade(LEVELMAX=5)
        self.assertEqual(self.problems("structure", name),
                         ["level 4 has no pixels", "level 5 has no pixels"])

    def test_a_file_that_starts_at_a_higher_level(self):
        problems = self.problems("structure", self.handmade(LEVELMIN=1, LEVELMAX=2))
        self.assertIn("the finest level is 1 in the header and 0 for the module", problems)

    def histogram(self, **more):
        fields = {"HIST_BAND": 0, "HIST_LEVEL": 0, "HIST_SOURCE": "ORVA", "HIST_BINCOUNT": 2,
                  "HIST_BINSIZE": 4, "HIST_MIN": 0, "HIST_MAX": 7, "HIST_COUNTS": "0|64", **more}
        return record("HISTOGRAMS", **fields)

    def test_a_histogram_that_agrees(self):
        name = self.handmade(self.histogram())
        self.assertEqual(self.problems("documents", name, status=0), [])
        self.assertEqual(self.problems("statistics", name, status=0), [])

    def test_histograms_of_what_is_not_there(self):
        records = self.histogram(HIST_BAND=4) + self.histogram(HIST_LEVEL=3)
        problems = self.problems("documents", self.handmade(records))
        self.assertEqual(problems, ["histogram of band 5, which the raster does not have",
                                    "histogram of level 3, which the raster does not have"])

    def test_histograms_without_counts(self):
        name = self.handmade(self.histogram(HIST_BINCOUNT=4000000000))
        problems = self.problems("documents", name)
        self.assertEqual(problems, ["histogram of band 1 has 0 counts for 4000000000 bins"])

    def test_bins_without_counts_take_no_memory(self):
        name = self.handmade(self.histogram(HIST_BINCOUNT=4000000000, HIST_BINSIZE=2e-9))
        self.assertEqual(self.problems("statistics", name), [])

    def test_versions_of_many_digits(self):
        for major in (2, 65535, 65536, 4294967295):
            self.assertEqual(self.problems("structure", self.handmade(VERSION_MAJOR=major),
                                           status=0), [])

    # Each of these says nothing about the pixels that could be counted anew.
    def test_histograms_that_are_not_counted_anew(self):
        for fields in ({"HIST_BINCOUNT": 0, "HIST_COUNTS": ""}, {"HIST_BINSIZE": 3},
                       {"HIST_MIN": 9, "HIST_MAX": 7}):
            with self.subTest(fields):
                name = self.handmade(self.histogram(**fields))
                self.assertEqual(self.problems("statistics", name, status=0), [])

    def test_histograms_of_other_counts(self):
        for counts in ("1|64", "64|0"):
            name = self.handmade(self.histogram(HIST_COUNTS=counts))
            problems = self.problems("statistics", name)
            self.assertEqual(len(problems), 1)
            self.assertRegex(problems[0], "band 1: [12] bins of the histogram differ")

    def statistics(self, **fields):
        return record("BANDSTATISTICS", RSTC_BAND=0, RSTC_LEVEL=0, **fields)

    def test_statistics_of_some_kinds_alone(self):
        name = self.handmade(self.statistics(RSTC_MEAN=7))
        self.assertEqual(self.problems("statistics", name, status=0), [])
        for fields, what in (({"RSTC_MINIMUM": 8}, "minimum is 8 in the file, and 7"),
                             ({"RSTC_MAXIMUM": 6}, "maximum is 6 in the file, and 7"),
                             ({"RSTC_SUM": 1}, "sum is 1 in the file, and 448"),
                             ({"RSTC_SUM2": 2}, "sum of squares is 2 in the file, and 3136"),
                             ({"RSTC_STANDARDDEVIATION": 1}, "standard deviation is 1")):
            with self.subTest(what):
                problems = self.problems("statistics", self.handmade(self.statistics(**fields)))
                self.assertEqual(len(problems), 1)
                self.assertIn("band 1: " + what, problems[0])

    def test_statistics_of_one_band_of_two(self):
        name = self.handmade(self.statistics(RSTC_MEAN=7), BANDS=2)
        self.assertEqual(self.problems("statistics", name, status=0), [])

    def test_statistics_of_values_that_are_not_there(self):
        pixels = np.full((40, 40, 1), np.nan, np.float32)
        geotiff(self.path("source.tif"), pixels, "Single")
        self.good("build", "source.tif", "made.pyr")
        self.problems("statistics", "made.pyr", status=0)

    def test_sources_that_are_others(self):
        name = self.handmade()
        geotiff(self.path("wide.tif"), samples("Byte", 8, 9, 1))
        self.assertEqual(self.problems("source", name, "--against", "wide.tif"),
                         ["wide.tif has 9 x 8 pixels"])
        geotiff(self.path("deep.tif"), samples("Byte", 8, 8, 3))
        self.assertEqual(len(self.problems("source", name, "--against", "deep.tif")), 1)
        geotiff(self.path("same.tif"), np.full((8, 8, 1), 7, np.uint8))
        self.assertEqual(self.problems("source", name, "--against", "same.tif", status=0), [])
