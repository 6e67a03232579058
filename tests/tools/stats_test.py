"""The command that renews statistics and histograms."""
import os
import stat
import unittest

import numpy as np

from frame import TYPES, ToolTest, geotiff, samples
from pyramid import Pyramid


class Stats(ToolTest):
    def built(self, kind="Byte", bands=3, *options, nodata=None, colors=None):
        pixels = samples(kind, 300, 400, bands)
        geotiff(self.path("a.tif"), pixels, kind, nodata=nodata, colors=colors)
        self.good("build", "a.tif", "a.pyr", "--overwrite", *options)
        return pixels

    def put(self, patch, x=5, y=6, band=0):
        """Writes into level 0 of the first tile as a host that stores no statistics."""
        file = Pyramid(self.path("a.pyr"))
        for row in range(patch.shape[0]):
            for column in range(patch.shape[1]):
                at = file.offset(0) + (((y + row) * min(256, file.width) + x + column) *
                                       file.bands + band) * file.type.itemsize
                with open(self.path("a.pyr"), "r+b") as handle:
                    handle.seek(at)
                    handle.write(patch[row, column].tobytes())

    def records(self):
        return self.document("info", "a.pyr")

    def test_of_every_type(self):
        for kind, (_, dtype) in TYPES.items():
            if np.issubdtype(dtype, np.complexfloating):
                continue
            with self.subTest(kind):
                pixels = self.built(kind, 2)
                before = self.records()
                self.assertEqual(self.good("stats", "a.pyr"),
                                 "a.pyr: statistics and histograms of 2 bands renewed\n")
                # As the builder has them.
                self.assertEqual(self.records(), before)
                pixels[6, 5, 0] = 7
                self.put(np.full((1, 1), 7, dtype))
                self.good("stats", "a.pyr")
                verdicts = {check["check"]: check["result"] for check in self.document(
                    "verify", "a.pyr", status=self.run_tool("verify", "a.pyr").returncode)[
                        "checks"]}
                self.assertEqual(verdicts["statistics"], "good")
                record = self.records()["statistics"][0]
                plane = pixels[:, :, 0].astype(np.longdouble)
                self.assertAlmostEqual(float(record["mean"]) / float(plane.mean()), 1, 9)

    def test_of_some_bands(self):
        self.built("Byte", 3)
        self.put(np.full((9, 9), 255, np.uint8), band=0)
        self.put(np.full((9, 9), 255, np.uint8), band=2)
        before = self.records()
        self.assertEqual(self.document("stats", "a.pyr", "--bands", "3,3"),
                         {"schema": 1, "file": "a.pyr", "bands": [3]})
        after = self.records()
        self.assertEqual([record["band"] for record in after["statistics"]], [1, 2, 3])
        for name in ("statistics", "histograms"):
            changed = [record["band"] for record, old in zip(
                sorted(after[name], key=lambda each: each["band"]), before[name]) if record != old]
            self.assertEqual(changed, [3], name)

    def test_colors_and_what_others_keep_in_the_document_stay(self):
        colors = [(1, 2, 3, 255), (4, 5, 6, 7)]
        self.built("Byte", 1, colors=colors)
        file = Pyramid(self.path("a.pyr"))
        text = file.data[file.end:].rstrip(b"\n").replace(
            b"</DATASET>", b"<NOTE a='>'>kept</NOTE><!-- <HISTOGRAMS> --></DATASET>")
        with open(self.path("a.pyr"), "r+b") as handle:
            handle.seek(file.end)
            handle.write(text)
        palettes = self.records()["palettes"]
        self.good("stats", "a.pyr")
        self.good("stats", "a.pyr")
        self.assertEqual(self.records()["palettes"], palettes)
        document = Pyramid(self.path("a.pyr")).document()
        self.assertEqual(document.find("NOTE").text, "kept")
        self.assertEqual(len(document.findall("BANDSTATISTICS")), 1)
        self.assertEqual(len(document.findall("HISTOGRAMS")), 1)

    def test_a_file_without_any_gets_some(self):
        self.built("Int16", 2, "--no-statistics")
        self.good("stats", "a.pyr")
        self.assertEqual(len(self.records()["statistics"]), 2)
        self.assertEqual(len(self.records()["histograms"]), 2)

    def test_pixels_without_data_do_not_count(self):
        pixels = self.built("Int16", 1, "--no-statistics", nodata=-32768)
        self.good("stats", "a.pyr")
        self.assertEqual(self.records()["statistics"][0]["minimum"],
                         int(pixels[pixels != -32768].min()))

    def test_the_marks_of_edited_bands_go(self):
        self.built("Byte", 2)
        with open(self.path("a.pyr.aux.xml"), "w", encoding="ascii") as sidecar:
            for band in (1, 2):
                sidecar.write("" if band != 1 else "<PAMDataset>")
                sidecar.write(f'<PAMRasterBand band="{band}"><Metadata domain="ZMCPYRAMID">'
                              '<MDI key="OLD_STATISTICS">2</MDI><MDI key="OLD_HISTOGRAMS">2</MDI>'
                              '</Metadata></PAMRasterBand>')
            sidecar.write("</PAMDataset>")
        self.good("stats", "a.pyr", "--bands", "1")
        with open(self.path("a.pyr.aux.xml"), encoding="ascii") as sidecar:
            text = sidecar.read()
        self.assertNotIn('band="1"', text)
        self.assertIn('<MDI key="OLD_STATISTICS">2</MDI>', text)
        self.good("stats", "a.pyr")
        self.assertEqual(self.files(), ["a.pyr", "a.tif"])

    def test_what_is_refused(self):
        self.built("Byte", 1)
        self.refused(1, "none.pyr: there is no such file", "stats", "none.pyr")
        self.refused(2, "--bands: there is no band 2: the raster has the bands 1 to 1", "stats",
                     "a.pyr", "--bands", "2")
        self.refused(1, "a.tif: cannot read the header: it is no pyramid file", "stats", "a.tif")
        self.built("ComplexSingle", 1)
        self.refused(1, "a.pyr: complex samples have no statistics", "stats", "a.pyr")

    def test_a_file_that_may_not_be_written(self):
        self.built("Byte", 1)
        os.chmod(self.path("a.pyr"), stat.S_IRUSR)
        before = Pyramid(self.path("a.pyr")).data
        self.refused(1, "a.pyr: cannot renew its statistics: the file is read-only", "stats",
                     "a.pyr")
        self.assertEqual(Pyramid(self.path("a.pyr")).data, before)


if __name__ == "__main__":
    unittest.main()
