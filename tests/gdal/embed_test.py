"""Files that keep in themselves what a sidecar would tell."""
import os
import shutil
import unittest

import numpy as np
from osgeo import gdal, osr
from rasters import DRIVER, FolderTest, memory_dataset, place, samples

GEOTRANSFORM = (500000, 30, 0, 4000000, 0, -30)


def rich(array, data_type=gdal.GDT_Byte):
    """A dataset with something of every kind that a sidecar keeps."""
    dataset = memory_dataset(array, data_type)
    place(dataset)
    dataset.SetMetadata({"TITLE": "a <b> & \"c\" \u00e4\u4e2d \U0001f30d", "LINES": "one\r\ntwo\tthree",
                         "CONTROL": "a\x01b"})
    dataset.SetMetadata({"KEY": "]]>"}, "OWN")
    band = dataset.GetRasterBand(1)
    band.SetNoDataValue(7)
    band.SetDescription("first")
    band.SetUnitType("m")
    band.SetScale(0.5)
    band.SetOffset(-3)
    band.SetCategoryNames(["none", "some", "PALETTE"])
    band.SetMetadataItem("BAND", "item")
    return dataset


class Embed(FolderTest):
    def make(self, name="a.pyr", source=None, **options):
        path = self.path(name)
        array = samples(gdal.GDT_Byte, 300, 400, 2)
        given = [f"{key}={value}" for key, value in options.items()]
        gdal.GetDriverByName(DRIVER).CreateCopy(path, source or rich(array), options=given)
        return path

    def embedded(self, name="a.pyr", **options):
        path = self.make(name, EMBED="YES", **options)
        self.assertFalse(os.path.exists(path + ".aux.xml"))
        return path

    def told(self, path):
        """All that a dataset tells which a file of pixels has no place for."""
        dataset = gdal.Open(path)
        reference = dataset.GetSpatialRef()
        metadata = {domain: dataset.GetMetadata(domain) for domain in ("", "OWN")}
        bands = []
        for number in range(1, dataset.RasterCount + 1):
            band = dataset.GetRasterBand(number)
            items = {key: value for key, value in band.GetMetadata().items()
                     if not key.startswith("STATISTICS")}
            bands.append((band.GetNoDataValue(), band.GetDescription(), band.GetUnitType(),
                          band.GetScale(), band.GetOffset(), band.GetCategoryNames(), items,
                          band.GetColorInterpretation(), band.GetMaskFlags()))
        return (reference and reference.ExportToWkt(), dataset.GetGeoTransform(can_return_null=True),
                metadata, bands)

    def test_a_file_that_is_moved_alone_tells_what_a_sidecar_would(self):
        beside = self.told(self.make("beside.pyr"))
        os.mkdir(self.path("far"))
        moved = os.path.join(self.folder, "far", "b.pyr")
        shutil.move(self.embedded(), moved)
        self.assertEqual(self.told(moved), beside)
        self.assertEqual(beside[1], GEOTRANSFORM)
        self.assertEqual(beside[3][0][:6], (7, "first", "m", 0.5, -3, ["none", "some", "PALETTE"]))
        self.assertEqual(os.listdir(self.path("far")), ["b.pyr"])

    def test_files_made_without_it_stay_as_they_are(self):
        plain, embedded = self.make("plain.pyr"), self.embedded()
        with open(plain, "rb") as file:
            expected = file.read()
        with open(embedded, "rb") as file:
            data = file.read()
        begin, end = data.index(b"\n\n  <SIDECAR>"), data.index(b"</SIDECAR>") + len(b"</SIDECAR>")
        self.assertEqual(data[:begin] + data[end:], expected)
        self.assertNotIn(b"SIDECAR", expected)

    def test_without_records_and_without_anything_to_keep(self):
        path = self.embedded(STATISTICS="NO")
        self.assertEqual(self.told(path), self.told(self.make("b.pyr", STATISTICS="NO")))
        np.testing.assert_array_equal(gdal.Open(path).ReadAsArray(),
                                      gdal.Open(self.path("b.pyr")).ReadAsArray())
        bare = memory_dataset(samples(gdal.GDT_UInt16, 20, 20, 9), gdal.GDT_UInt16)
        sizes = [os.path.getsize(self.make(name, bare, **options))
                 for name, options in (("c.pyr", {}), ("d.pyr", {"EMBED": "YES"}))]
        self.assertEqual(sizes[0], sizes[1])

    def test_a_dataset_that_is_written_block_by_block(self):
        path = self.path("a.pyr")
        dataset = gdal.GetDriverByName(DRIVER).Create(path, 300, 200, 2, gdal.GDT_Int16,
                                                      ["EMBED=YES"])
        place(dataset)
        dataset.GetRasterBand(2).SetNoDataValue(-5)
        table = gdal.ColorTable()
        table.SetColorEntry(3, (1, 2, 3, 255))
        dataset.GetRasterBand(1).SetColorTable(table)
        array = samples(gdal.GDT_Int16, 200, 300, 2)
        dataset.WriteArray(array)
        dataset = None
        self.assertEqual(self.files(), ["a.pyr"])
        dataset = gdal.Open(path)
        self.assertEqual(dataset.GetGeoTransform(), GEOTRANSFORM)
        self.assertEqual([dataset.GetRasterBand(n).GetNoDataValue() for n in (1, 2)], [None, -5])
        self.assertEqual(dataset.GetRasterBand(1).GetColorTable().GetColorEntry(3), (1, 2, 3, 255))
        np.testing.assert_array_equal(dataset.ReadAsArray(), array)

    def test_the_sidecar_is_preferred_item_by_item(self):
        path = self.embedded()
        expected = self.told(path)
        with open(path + ".aux.xml", "w") as file:
            file.write('<PAMDataset><GeoTransform>1,2,0,3,0,-2</GeoTransform><PAMRasterBand band="1">'
                       '<Description>other</Description></PAMRasterBand></PAMDataset>')
        told = self.told(path)
        self.assertEqual(told[:3], (expected[0], (1, 2, 0, 3, 0, -2), expected[2]))
        self.assertEqual(told[3][0], (7, "other") + expected[3][0][2:])
        self.assertEqual(told[3][1], expected[3][1])

    def test_reading_writes_no_sidecar(self):
        path = self.embedded()
        with open(path, "rb") as file:
            before = file.read()
        for access in (gdal.GA_ReadOnly, gdal.GA_Update):
            dataset = gdal.Open(path, access)
            dataset.GetRasterBand(1).GetStatistics(False, True)
            dataset.GetRasterBand(1).Checksum()
            dataset = None
        self.assertEqual(self.files(), ["a.pyr"])
        with open(path, "rb") as file:
            self.assertEqual(file.read(), before)

    def test_what_is_changed_goes_to_the_sidecar_with_all_the_rest(self):
        path = self.embedded()
        expected = self.told(path)
        dataset = gdal.Open(path, gdal.GA_Update)
        dataset.SetGeoTransform((1, 1, 0, 1, 0, -1))
        dataset = None
        self.assertEqual(self.told(path), expected[:1] + ((1, 1, 0, 1, 0, -1),) + expected[2:])
        os.remove(path + ".aux.xml")
        self.assertEqual(self.told(path), expected)

    def test_what_is_removed_does_not_come_back(self):
        path = self.embedded()
        dataset = gdal.Open(path, gdal.GA_Update)
        dataset.GetRasterBand(1).DeleteNoDataValue()
        dataset.GetRasterBand(1).SetDescription("")
        dataset = None
        bands = self.told(path)[3]
        self.assertEqual(bands[0][:3], (None, "", "m"))

    def test_stores_of_the_file_keep_it(self):
        path = self.embedded()
        expected = self.told(path)
        for _ in range(2):
            dataset = gdal.Open(path, gdal.GA_Update)
            band = dataset.GetRasterBand(2)
            band.SetStatistics(1, 2, 1.5, 0.25)
            band.SetDefaultHistogram(0, 2, [5, 6])
            table = gdal.ColorTable()
            table.SetColorEntry(0, (9, 8, 7, 255))
            dataset.GetRasterBand(1).SetColorTable(table)
            dataset = None
        self.assertEqual(self.files(), ["a.pyr"])
        told = self.told(path)
        self.assertEqual(told[:3], expected[:3])
        self.assertEqual([band[:7] for band in told[3]], [band[:7] for band in expected[3]])
        dataset = gdal.Open(path)
        self.assertEqual(dataset.GetRasterBand(2).GetStatistics(False, False), [1, 2, 1.5, 0.25])

    def test_what_is_stored_into_the_dataset_that_was_made_keeps_it(self):
        path = self.path("a.pyr")
        source = rich(samples(gdal.GDT_Byte, 30, 40, 1))
        dataset = gdal.GetDriverByName(DRIVER).CreateCopy(path, source, options=["EMBED=YES"])
        dataset.GetRasterBand(1).SetStatistics(1, 2, 1.5, 0.25)
        self.assertEqual(dataset.GetGeoTransform(), GEOTRANSFORM)
        dataset = None
        self.assertEqual(self.told(path)[1], GEOTRANSFORM)
        self.assertEqual(self.files(), ["a.pyr"])

    def test_a_copy_of_a_file_that_has_it_is_like_any_other(self):
        path = self.embedded()
        copy = self.make("copy.pyr", gdal.Open(path))
        self.assertEqual(self.told(copy), self.told(path))
        with open(copy, "rb") as file:
            self.assertNotIn(b"SIDECAR", file.read())
        with open(copy + ".aux.xml") as file:
            self.assertNotIn("EMBEDDED", file.read())

    def test_levels_and_virtual_files_have_it_too(self):
        path = self.embedded()
        coarse = gdal.OpenEx(path, open_options=["OVERVIEW_LEVEL=0"])
        self.assertEqual(coarse.GetGeoTransform()[1], 60)
        with open(path, "rb") as file:
            gdal.FileFromMemBuffer("/vsimem/embed.pyr", file.read())
        self.assertEqual(self.told("/vsimem/embed.pyr"), self.told(path))
        gdal.Unlink("/vsimem/embed.pyr")

    def test_a_malformed_document_tells_nothing(self):
        path = self.embedded()
        with open(path, "r+b") as file:
            file.truncate(os.path.getsize(path) - 20)
        self.assertEqual(self.told(path)[:2], (None, None))

    def test_items_that_gdal_does_not_understand_are_left_alone(self):
        path = self.embedded()
        with open(path, "rb") as file:
            data = file.read()
        with open(path, "wb") as file:
            file.write(data.replace(b"&lt;PAMDataset&gt;", b"&lt;PAMDatasex&gt;"))
        self.assertEqual(self.told(path)[:2], (None, None))

    def test_levels_in_other_files_are_not_looked_for(self):
        """A sidecar may name a file of levels; a pyramid comes from anywhere, and opens no other."""
        path = self.embedded(LEVELS="0")
        gdal.GetDriverByName("GTiff").Create(self.path("other.tif"), 200, 150, 2)
        item = (b'&lt;PAMDataset&gt;&lt;Metadata domain="OVERVIEWS"&gt;&lt;MDI key="OVERVIEW_FILE"&gt;'
                b":::BASE:::other.tif&lt;/MDI&gt;&lt;/Metadata&gt;")
        with open(path, "rb") as file:
            data = file.read()
        with open(path, "wb") as file:
            file.write(data.replace(b"&lt;PAMDataset&gt;", item))
        dataset = gdal.Open(path)
        self.assertIsNone(dataset.GetMetadataItem("OVERVIEW_FILE", "OVERVIEWS"))
        self.assertEqual(dataset.GetRasterBand(1).GetOverviewCount(), 0)
        self.assertEqual(dataset.GetGeoTransform(), GEOTRANSFORM)
        self.assertEqual(dataset.GetFileList(), [path])

    def test_text_that_no_document_takes_is_refused_and_leaves_nothing(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 20, 20, 1), gdal.GDT_Byte)
        source.SetMetadataItem("KEY", "\uffff")
        with self.assertRaisesRegex(RuntimeError, "keep its metadata in the file"):
            self.make("a.pyr", source, EMBED="YES")
        self.assertEqual(self.files(), [])

    def test_a_mask_stands_beside_the_file(self):
        source = rich(samples(gdal.GDT_Byte, 20, 20, 1))
        source.GetRasterBand(1).DeleteNoDataValue()
        source.CreateMaskBand(gdal.GMF_PER_DATASET)
        source.GetRasterBand(1).GetMaskBand().Fill(255)
        path = self.make("a.pyr", source, EMBED="YES")
        self.assertEqual(self.files(), ["a.pyr", "a.pyr.msk"])
        dataset = gdal.Open(path)
        self.assertEqual(dataset.GetRasterBand(1).GetMaskFlags(), gdal.GMF_PER_DATASET)


if __name__ == "__main__":
    unittest.main()
