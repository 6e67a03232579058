"""What info tells, against the file itself."""
import json
import os
import subprocess
import unittest

import numpy as np
from osgeo import gdal, osr

from frame import COUNT, REAL, TOOL, ToolTest, geotiff, samples
from pyramid import Pyramid

OPTIONAL = (int, float, str, None)
SHAPE = {
    "schema": int, "file": str, "width": int, "height": int, "bands": int, "pixelType": str,
    "interleave": str, "tileOrdering": str, "tileSize": int, "version": str, "levelMin": int,
    "levelMax": int, "complete": bool, "bytesMissing": COUNT,
    "levels": [{"level": int, "width": int, "height": int, "tilesAcross": int, "tilesDown": int,
                "offset": (int, str, None), "bytes": COUNT}],
    "statistics": [{"band": int, "minimum": OPTIONAL, "maximum": OPTIONAL, "mean": OPTIONAL,
                    "standardDeviation": OPTIONAL, "sum": OPTIONAL, "sumOfSquares": OPTIONAL,
                    "rootMeanSquare": OPTIONAL}],
    "histograms": [{"band": int, "level": int, "binCount": int, "binSize": REAL, "minimum": REAL,
                    "maximum": REAL, "counts": [COUNT]}],
    "palettes": [{"band": int, "colors": [[int]]}],
    "crs": ({"name": str, "authority": (str, None), "wkt": str}, None),
    "geoTransform": ([REAL], None), "noData": ([OPTIONAL], None),
}


class Info(ToolTest):
    def test_the_document(self):
        pixels = self.pyramid()
        info = self.document("info", "picture.pyr")
        self.assertShape(info, SHAPE)
        file = Pyramid(self.path("picture.pyr"))
        self.assertEqual((info["width"], info["height"], info["bands"]), (700, 300, 3))
        self.assertEqual((info["pixelType"], info["version"], info["tileSize"]), ("Byte", "1.1", 256))
        self.assertEqual((info["complete"], info["bytesMissing"]), (True, 0))
        for level in info["levels"]:
            number = level["level"]
            self.assertEqual((level["width"], level["height"]), file.size(number))
            self.assertEqual((level["tilesAcross"], level["tilesDown"]), file.tiles(number))
            self.assertEqual(level["offset"], file.offset(number))
            self.assertEqual(level["bytes"], file.level_bytes(number))
        for band, record in enumerate(info["statistics"]):
            plane = pixels[:, :, band].astype(np.float64)
            self.assertEqual(record["band"], band + 1)
            self.assertEqual((record["minimum"], record["maximum"]), (plane.min(), plane.max()))
            self.assertEqual(record["sum"], plane.sum())
            self.assertAlmostEqual(record["mean"], plane.mean(), 10)
            self.assertAlmostEqual(record["standardDeviation"], plane.std(), 9)
        for band, record in enumerate(info["histograms"]):
            counts = np.bincount(pixels[:, :, band].ravel(), minlength=256)
            self.assertEqual(record["counts"], counts.tolist())

    def test_a_palette_is_told_to_people_by_its_number_of_colours(self):
        colors = [(i, 255 - i, 7, 255) for i in range(256)]
        geotiff(self.path("source.tif"), samples("Byte", 20, 30, 1), colors=colors)
        self.good("build", "source.tif", "made.pyr")
        self.assertEqual(self.document("info", "made.pyr")["palettes"],
                         [{"band": 1, "colors": [list(color) for color in colors]}])
        self.assertIn("palette of band 1: 256 colors", self.good("info", "made.pyr").splitlines())

    def test_the_place_on_earth_and_no_data(self):
        geotiff(self.path("source.tif"), samples("Int16", 20, 30, 2), "Int16", nodata=-7)
        source = gdal.Open(self.path("source.tif"), gdal.GA_Update)
        system = osr.SpatialReference()
        system.ImportFromEPSG(32633)
        source.SetSpatialRef(system)
        source.SetGeoTransform((500000, 10, 0, 4600000, 0, -10.5))
        del source
        self.good("build", "source.tif", "made.pyr")
        info = self.document("info", "made.pyr")
        self.assertShape(info, SHAPE)
        self.assertEqual((info["crs"]["name"], info["crs"]["authority"]),
                         ("WGS 84 / UTM zone 33N", "EPSG:32633"))
        self.assertTrue(osr.SpatialReference(info["crs"]["wkt"]).IsSame(system))
        self.assertEqual(info["geoTransform"], [500000, 10, 0, 4600000, 0, -10.5])
        self.assertEqual(info["noData"], [-7, -7])
        self.assertIn("\ncoordinate system WGS 84 / UTM zone 33N, EPSG:32633\n"
                      "upper left corner 500000, 4600000; pixels of 10 x -10.5\n"
                      "no-data value -7\n", self.good("info", "made.pyr"))
        os.remove(self.path("made.pyr.aux.xml"))
        info = self.document("info", "made.pyr")
        self.assertEqual((info["crs"], info["geoTransform"], info["noData"]), (None, None, None))

    def test_a_place_that_is_turned_and_no_data_of_some_bands(self):
        geotiff(self.path("source.tif"), samples("Double", 20, 30, 3), "Double")
        self.good("build", "source.tif", "made.pyr")
        with open(self.path("made.pyr.aux.xml"), "w") as file:
            file.write('<PAMDataset><SRS>LOCAL_CS["a\x7fb"]</SRS><GeoTransform>1,2,3,4,5,6'
                       '</GeoTransform><PAMRasterBand band="2"><NoDataValue>nan</NoDataValue>'
                       '</PAMRasterBand></PAMDataset>')
        self.assertIn("\ncoordinate system a\\x7fb\ngeotransform 1, 2, 3, 4, 5, 6\n"
                      "no-data values of the bands none, NaN, none\n",
                      self.good("info", "made.pyr"))
        self.assertEqual(self.document("info", "made.pyr")["noData"], [None, "NaN", None])

    def test_integers_of_64_bits_that_mean_no_data(self):
        geotiff(self.path("source.tif"), samples("Int64", 20, 30, 1), "Int64")
        self.good("build", "source.tif", "made.pyr")
        with open(self.path("made.pyr.aux.xml"), "w") as file:
            file.write('<PAMDataset><PAMRasterBand band="1"><NoDataValue>-9223372036854775807'
                       '</NoDataValue></PAMRasterBand></PAMDataset>')
        self.assertEqual(self.document("info", "made.pyr")["noData"], ["-9223372036854775807"])

    def test_a_sidecar_that_is_no_xml(self):
        self.pyramid()
        with open(self.path("picture.pyr.aux.xml"), "w") as file:
            file.write("<PAMDataset><SRS>")
        info = self.document("info", "picture.pyr")
        self.assertEqual((info["crs"], len(info["statistics"])), (None, 3))

    def test_records_behind_those_of_as_many_bands_as_there_are(self):
        """As GDAL's users leave them who ask for the statistics of the first band again."""
        pixels = self.pyramid()
        file = Pyramid(self.path("picture.pyr"))
        records = "".join(
            f"<BANDSTATISTICS><RSTC_BAND>{band}</RSTC_BAND><RSTC_MEAN>"
            f"{pixels[:, :, band].astype(np.float64).mean():.15g}</RSTC_MEAN></BANDSTATISTICS>"
            for band in (0, 0, 0, 1, 2))
        with open(self.path("picture.pyr"), "r+b") as handle:
            handle.truncate(file.end)
            handle.seek(file.end)
            handle.write(f"<DATASET>{records}</DATASET>".encode())
        shown = self.document("info", "picture.pyr")["statistics"]
        self.assertEqual([record["band"] for record in shown], [1, 2, 3])
        for band, record in enumerate(shown):
            self.assertAlmostEqual(record["mean"], pixels[:, :, band].mean(), 9)
        self.assertEqual(self.document("verify", "picture.pyr")["file"], "picture.pyr")

    def parses(self, *arguments):
        """How many documents the tool parses for a command."""
        count = self.path("parses")
        environment = dict(os.environ, LD_PRELOAD=os.environ["ZMC_PARSE_COUNTER"],
                           ZMC_PARSE_COUNT=count)
        subprocess.run([TOOL, *arguments], env=environment, cwd=self.folder, check=True,
                       stdout=subprocess.DEVNULL)
        with open(count, encoding="ascii") as file:
            return int(file.read())

    @unittest.skipUnless("ZMC_PARSE_COUNTER" in os.environ, "this build cannot count them")
    def test_one_parse_of_a_document_serves_any_number_of_bands(self):
        for bands in (2, 200):
            geotiff(self.path("source.tif"), samples("Byte", 4, 4, bands))
            self.good("build", "source.tif", f"made{bands}.pyr")
            self.assertEqual(len(self.document("info", f"made{bands}.pyr")["statistics"]), bands)
        for command in (["info"], ["verify", "--threads", "1"]):
            few = self.parses(*command, "made2.pyr")
            self.assertEqual(self.parses(*command, "made200.pyr"), few)
            self.assertLess(few, 10)
        # The module reads the header once more for each further thread, which both looks at pixels have.
        self.assertEqual(self.parses("verify", "made2.pyr", "--threads", "3"), few + 4)

    @unittest.skipUnless("ZMC_PARSE_COUNTER" in os.environ, "this build cannot count them")
    def test_a_document_is_judged_by_the_parse_that_reads_it(self):
        self.pyramid()
        file = Pyramid(self.path("picture.pyr"))
        with open(self.path("picture.pyr"), "rb") as handle:
            tiles = handle.read()[:file.end]
        with open(self.path("bare.pyr"), "wb") as handle:
            handle.write(tiles)
        # Without statistics there is one look less.
        for threads, more in (("1", 1), ("3", 3)):
            self.assertEqual(self.parses("verify", "picture.pyr", "--threads", threads),
                             self.parses("verify", "bare.pyr", "--threads", threads) + more)

    def test_the_ordering_morton_has_no_offsets(self):
        geotiff(self.path("source.tif"), samples("Byte", 40, 50, 9))
        self.good("build", "source.tif", "made.pyr")
        info = self.document("info", "made.pyr")
        self.assertShape(info, SHAPE)
        self.assertEqual({level["offset"] for level in info["levels"]}, {None})

    def test_numbers_that_json_does_not_carry_are_strings(self):
        pixels = np.full((4, 4, 1), np.uint64(2**60), np.uint64)
        geotiff(self.path("source.tif"), pixels, "UInt64")
        self.good("build", "source.tif", "made.pyr")
        record = self.document("info", "made.pyr")["statistics"][0]
        self.assertEqual((record["minimum"], record["maximum"]), (str(2**60), str(2**60)))

    def test_complex_bands_have_no_statistics(self):
        geotiff(self.path("source.tif"), samples("ComplexSingle", 20, 20, 1), "ComplexSingle")
        self.good("build", "source.tif", "made.pyr")
        self.assertEqual(self.document("info", "made.pyr")["statistics"], [])

    def test_what_is_missing_of_an_incomplete_file(self):
        self.pyramid()
        file = Pyramid(self.path("picture.pyr"))
        with open(self.path("picture.pyr"), "r+b") as handle:
            handle.truncate(file.end - 1000)
        info = self.document("info", "picture.pyr")
        self.assertEqual((info["complete"], info["bytesMissing"]), (False, 1000))
        self.assertIn("not complete: 1000 bytes are missing", self.good("info", "picture.pyr"))

    def test_a_malformed_document(self):
        self.pyramid()
        os.truncate(self.path("picture.pyr"), os.path.getsize(self.path("picture.pyr")) - 20)
        done = self.run_tool("info", "picture.pyr", "--json")
        self.assertEqual(done.returncode, 0)
        self.assertRegex(done.stderr, r"^zmcraster: picture\.pyr: warning: the metadata document is "
                                      r"malformed: .*\n$")
        self.assertEqual(json.loads(done.stdout)["statistics"], [])

    def test_text_for_people(self):
        self.pyramid()
        text = self.good("info", "picture.pyr")
        self.assertIn("700 x 300 pixels, 3 bands of Byte", text)
        self.assertIn("histogram of band 3, level 0: 256 bins of 1 from 0 to 255", text)
        self.assertNotIn("\x1b", text)
        self.assertNotIn("█", text)
