"""Comparing rasters of all kinds."""
import numpy as np

from frame import COUNT, REAL, ToolTest, geotiff, no_new_threads, samples


class Compare(ToolTest):
    def test_equal_rasters(self):
        self.pyramid()
        self.assertEqual(self.good("compare", "picture.tif", "picture.pyr"),
                         "picture.tif and picture.pyr are equal\n")
        document = self.document("compare", "picture.pyr", "picture.tif")
        self.assertShape(document, {
            "schema": int, "files": [str], "tolerance": REAL, "equal": bool, "shape": [str],
            "bands": [{"band": int, "samplesDiffering": COUNT, "greatestDifference": REAL,
                       "first": ([int], None)}]})
        self.assertTrue(document["equal"])

    def test_one_sample_in_one_band(self):
        pixels = samples("Int32", 400, 300, 2)
        geotiff(self.path("a.tif"), pixels, "Int32")
        pixels[301, 17, 1] ^= 1
        geotiff(self.path("b.tif"), pixels, "Int32")
        self.good("build", "b.tif", "b.pyr")
        document = self.document("compare", "a.tif", "b.pyr", status=3)
        self.assertFalse(document["equal"])
        self.assertEqual(document["bands"][0]["samplesDiffering"], 0)
        self.assertEqual(document["bands"][1], {"band": 2, "samplesDiffering": 1,
                                                "greatestDifference": 1, "first": [17, 301]})
        done = self.run_tool("compare", "a.tif", "b.pyr")
        self.assertEqual((done.returncode, done.stdout, done.stderr),
                         (3, "band 2: 1 samples differ, by up to 1, first at 17,301\n", ""))
        self.assertTrue(self.document("compare", "a.tif", "b.pyr", "--tolerance", 1)["equal"])

    def test_rasters_beyond_one_strip(self):
        pixels = np.arange(1500 * 2000 * 2, dtype=np.float64).reshape(1500, 2000, 2)
        geotiff(self.path("a.tif"), pixels, "Double")
        pixels[1499, 1999, 0] -= 2
        for line in (3, 700, 701, 1400):
            pixels[line, line, 1] += line
        geotiff(self.path("b.tif"), pixels, "Double")
        bands = self.document("compare", "a.tif", "b.tif", status=3)["bands"]
        self.assertEqual(bands, [
            {"band": 1, "samplesDiffering": 1, "greatestDifference": 2, "first": [1999, 1499]},
            {"band": 2, "samplesDiffering": 4, "greatestDifference": 1400, "first": [3, 3]}])

    def test_where_no_thread_can_be_had(self):
        self.pyramid()
        said = self.good("compare", "picture.tif", "picture.pyr", preexec_fn=no_new_threads)
        self.assertEqual(said, "picture.tif and picture.pyr are equal\n")

    def test_types_are_compared_as_numbers(self):
        pixels = samples("Byte", 20, 30, 1)
        geotiff(self.path("a.tif"), pixels)
        geotiff(self.path("b.tif"), pixels.astype(np.float64), "Double")
        self.assertTrue(self.document("compare", "a.tif", "b.tif")["equal"])

    def test_sixty_four_bits_count(self):
        pixels = samples("UInt64", 20, 30, 1)
        geotiff(self.path("a.tif"), pixels, "UInt64")
        pixels[4, 5] ^= np.uint64(1)
        geotiff(self.path("b.tif"), pixels, "UInt64")
        document = self.document("compare", "a.tif", "b.tif", status=3)
        self.assertEqual(document["bands"][0]["greatestDifference"], 1)
        pixels[:] = 0
        geotiff(self.path("c.tif"), pixels, "UInt64")
        pixels[0, 0] = 2**64 - 1
        geotiff(self.path("d.tif"), pixels, "UInt64")
        document = self.document("compare", "c.tif", "d.tif", status=3)
        self.assertEqual(document["bands"][0]["greatestDifference"], str(2**64 - 1))

    def test_differences_that_no_double_holds(self):
        for name, value in (("a.tif", 1.7e308), ("b.tif", -1.7e308)):
            geotiff(self.path(name), np.full((3, 3, 1), value), "Double")
        document = self.document("compare", "a.tif", "b.tif", status=3)
        self.assertRegex(document["bands"][0]["greatestDifference"], r"^3\.39999.*e\+308$")

    def test_not_a_number_is_equal_to_itself_only(self):
        pixels = np.zeros((3, 3, 1), np.float32)
        pixels[1, 1] = np.nan
        geotiff(self.path("a.tif"), pixels, "Single")
        self.assertTrue(self.document("compare", "a.tif", "a.tif")["equal"])
        geotiff(self.path("b.tif"), np.zeros((3, 3, 1), np.float32), "Single")
        document = self.document("compare", "a.tif", "b.tif", "--tolerance", 1e9, status=3)
        self.assertEqual(document["bands"][0]["greatestDifference"], "Infinity")

    def test_shapes(self):
        self.picture("a.tif", 10, 20, 3)
        self.picture("b.tif", 20, 10, 1)
        document = self.document("compare", "a.tif", "b.tif", status=3)
        self.assertEqual(document["shape"], ["size: 20 x 10 and 10 x 20 pixels", "bands: 3 and 1"])
