"""Pyramids behind a network: how many requests they take, and what a server may do wrong."""
import gzip
import os
import shutil
import tempfile
import time
import unittest
import zipfile

import numpy as np
from osgeo import gdal

from rasters import DRIVER, FolderTest, halve, memory_dataset, place, samples
from server import Server

FRONT = "bytes=0-16383"


class Settings:
    """Settings of GDAL for as long as a block runs."""

    def __init__(self, **settings):
        self.settings = settings

    def __enter__(self):
        self.before = {name: gdal.GetConfigOption(name) for name in self.settings}
        for name, value in self.settings.items():
            gdal.SetConfigOption(name, value)

    def __exit__(self, *_):
        for name, value in self.before.items():
            gdal.SetConfigOption(name, value)


class ServedTest(FolderTest):
    """A pyramid of 9 x 7 tiles of three bytes a pixel, behind a server."""
    HEIGHT, WIDTH = 1700, 2300
    TILE = 256 * 256 * 3

    @classmethod
    def setUpClass(cls):
        cls.array = samples(gdal.GDT_Byte, cls.HEIGHT, cls.WIDTH, 3)
        cls.other = samples(gdal.GDT_Byte, cls.HEIGHT, cls.WIDTH, 3, seed=2)
        cls.made = tempfile.mkdtemp(prefix="zmcgdal")
        cls.addClassCleanup(shutil.rmtree, cls.made)
        for array, name in ((cls.array, "scene.pyr"), (cls.other, "other.pyr")):
            source = memory_dataset(array, gdal.GDT_Byte)
            place(source)
            gdal.GetDriverByName(DRIVER).CreateCopy(os.path.join(cls.made, name), source)

    def setUp(self):
        super().setUp()
        self.file = self.take("scene.pyr")
        self.server = Server(self.folder)
        self.addCleanup(self.server.stop)
        self.addCleanup(gdal.VSICurlClearCache)
        self.name = "/vsicurl/" + self.server.url + "scene.pyr"

    def take(self, name):
        for ending in ("", ".aux.xml"):
            shutil.copy(os.path.join(self.made, name + ending), self.path(name + ending))
        return self.path(name)

    def open(self, name=None, options=()):
        dataset = gdal.OpenEx(name or self.name, gdal.OF_RASTER, open_options=list(options))
        self.assertEqual(dataset.GetDriver().ShortName, "ZMCPyramid")
        return dataset

    def check_window(self, dataset, x=600, y=600, width=1024, height=768):
        np.testing.assert_array_equal(dataset.ReadAsArray(x, y, width, height),
                                      self.array[:, y:y + height, x:x + width])

    def asked(self):
        """What was asked for since the last call, in the order of the file."""
        taken = [(request.method, request.path, request.range) for request in self.server.take()]
        return sorted(taken, key=lambda each: (each[0], each[1], len(each[2] or ""), each[2] or ""))

    def swap(self):
        """Puts another raster of the same size in place of the one that is served."""
        size = os.path.getsize(self.file)
        made = self.take("other.pyr")
        with open(made, "ab") as stream:
            stream.truncate(size)
        os.replace(made, self.file)
        os.utime(self.file, (time.time() + 10,) * 2)

    def assert_fails(self, reason, work):
        """It fails, and says why in one line."""
        with self.assertRaisesRegex(RuntimeError, reason) as caught:
            work()
        self.assertNotIn("\n", str(caught.exception))


class Requests(ServedTest):
    def test_opening_is_one_request_beside_those_of_gdal_itself(self):
        dataset = self.open()
        self.assertEqual(self.asked(), [("GET", "/scene.pyr", FRONT), ("GET", "/scene.pyr", FRONT),
                                        ("HEAD", "/scene.pyr", None)])
        self.assertEqual(dataset.GetRasterBand(1).GetOverviewCount(), 4)
        self.assertEqual(dataset.RasterCount, 3)
        self.assertEqual(self.asked(), [])

    def test_a_window_is_one_request_for_each_row_of_tiles(self):
        dataset = self.open()
        self.server.take()
        self.check_window(dataset)
        requests = self.server.take()
        self.assertEqual(len(requests), 4)
        for request in requests:
            first, last = map(int, request.range[len("bytes="):].split("-"))
            self.assertEqual((request.method, last + 1 - first), ("GET", 5 * self.TILE))
        self.check_window(dataset)
        self.check_window(dataset, 700, 700, 500, 300)
        self.assertEqual(self.asked(), [])

    def test_rows_that_lie_together_are_one_request(self):
        dataset = self.open()
        self.server.take()
        self.check_window(dataset, 0, 256, self.WIDTH, 512)
        self.assertEqual(len(self.asked()), 1)

    def test_bands_and_blocks_of_a_window_are_asked_for_once(self):
        dataset = self.open()
        self.server.take()
        for band in (1, 2, 3):
            np.testing.assert_array_equal(
                dataset.GetRasterBand(band).ReadAsArray(600, 600, 1024, 768),
                self.array[band - 1, 600:1368, 600:1624])
        self.assertEqual(len(self.asked()), 4)
        dataset.GetRasterBand(1).ReadBlock(0, 0)
        self.assertEqual(len(self.asked()), 1)

    def test_slivers_that_go_through_blocks_are_one_group_too(self):
        dataset = self.open()
        self.server.take()
        self.check_window(dataset, 10, 700, 2200, 3)
        self.assertEqual(len(self.asked()), 1)

    def test_tiles_that_are_held_are_not_asked_for_again(self):
        dataset = self.open()
        self.check_window(dataset, 512, 512, 512, 512)
        self.server.take()
        self.check_window(dataset, 512, 512, 1024, 512)
        requests = self.server.take()
        self.assertEqual(len(requests), 2)
        for request in requests:
            first, last = map(int, request.range[len("bytes="):].split("-"))
            self.assertEqual(last + 1 - first, 2 * self.TILE)

    def test_an_overview_is_one_request(self):
        dataset = self.open()
        self.server.take()
        half = dataset.ReadAsArray(buf_xsize=self.WIDTH // 2, buf_ysize=self.HEIGHT // 2)
        np.testing.assert_array_equal(half, halve(self.array))
        self.assertEqual(len(self.asked()), 1)

    def test_statistics_are_read_when_they_are_asked_for(self):
        dataset = self.open()
        self.check_window(dataset)
        self.server.take()
        plain = gdal.Open(self.file)
        for band in (1, 2, 3):
            self.assertEqual(dataset.GetRasterBand(band).GetStatistics(False, False),
                             plain.GetRasterBand(band).GetStatistics(False, False))
            self.assertEqual(dataset.GetRasterBand(band).GetDefaultHistogram(),
                             plain.GetRasterBand(band).GetDefaultHistogram())
        # The document, and once whether a sidecar tells that its records are of other pixels.
        paths = [path for _, path, _ in self.asked()]
        self.assertEqual(paths.count("/scene.pyr"), 1)
        self.assertEqual(set(paths) - {"/"}, {"/scene.pyr", "/scene.pyr.aux.xml"})

    def test_the_sidecar_is_looked_for_when_it_is_asked_for(self):
        dataset = self.open()
        self.server.take()
        self.assertEqual(dataset.GetGeoTransform(), (500000, 30, 0, 4000000, 0, -30))
        self.assertIn("/scene.pyr.aux.xml", [path for _, path, _ in self.asked()])
        self.assertEqual(dataset.GetSpatialRef().GetAuthorityCode(None), "32631")
        self.assertEqual(self.asked(), [])

    def test_what_is_set_before_the_sidecar_was_looked_for_stays(self):
        dataset = self.open()
        dataset.SetGeoTransform([1, 2, 0, 3, 0, -4])
        dataset.GetRasterBand(2).SetDescription("mine")
        self.assertEqual(dataset.GetGeoTransform(), (1, 2, 0, 3, 0, -4))
        self.assertEqual(dataset.GetRasterBand(2).GetDescription(), "mine")
        self.assertEqual(dataset.GetSpatialRef().GetAuthorityCode(None), "32631")
        # GDAL cannot save what was set, and says so when the dataset goes.
        gdal.PushErrorHandler("CPLQuietErrorHandler")
        gdal.DontUseExceptions()
        dataset = None
        gdal.UseExceptions()
        gdal.PopErrorHandler()

    def test_a_small_store_reads_a_large_raster_right(self):
        for size in ("0", "1", "500K", "2M"):
            dataset = self.open(options=["REMOTE_CACHE=" + size])
            np.testing.assert_array_equal(dataset.ReadAsArray(), self.array)
            np.testing.assert_array_equal(dataset.ReadAsArray(buf_xsize=self.WIDTH // 2,
                                                              buf_ysize=self.HEIGHT // 2),
                                          halve(self.array))

    def test_a_store_of_no_size_is_refused(self):
        self.assert_fails("REMOTE_CACHE", lambda: self.open(options=["REMOTE_CACHE=much"]))

    def test_a_raster_of_bands_apart(self):
        array = samples(gdal.GDT_UInt16, 600, 900, 10)
        self.copy(memory_dataset(array, gdal.GDT_UInt16), "bands.pyr")
        dataset = self.open("/vsicurl/" + self.server.url + "bands.pyr")
        self.server.take()
        np.testing.assert_array_equal(dataset.GetRasterBand(7).ReadAsArray(300, 100, 500, 400),
                                      array[6, 100:500, 300:800])
        self.assertLessEqual(len(self.asked()), 4)
        np.testing.assert_array_equal(dataset.ReadAsArray(), array)


class ReadingAhead(ServedTest):
    def test_what_is_advised_is_fetched_and_then_read_without_a_request(self):
        dataset = self.open()
        self.server.take()
        dataset.AdviseRead(600, 600, 1024, 768)
        self.assertEqual(len(self.asked()), 4)
        self.check_window(dataset)
        self.assertEqual(self.asked(), [])

    def test_a_band_is_advised_like_its_dataset(self):
        dataset = self.open()
        self.server.take()
        dataset.GetRasterBand(2).AdviseRead(600, 600, 1024, 768)
        self.assertEqual(len(self.asked()), 4)
        self.check_window(dataset)
        self.assertEqual(self.asked(), [])

    def test_a_reduced_window_is_fetched_from_its_level(self):
        dataset = self.open()
        self.server.take()
        dataset.GetRasterBand(1).GetOverview(0).AdviseRead(0, 0, self.WIDTH // 2, self.HEIGHT // 2)
        self.assertEqual(len(self.asked()), 1)
        dataset.ReadAsArray(buf_xsize=self.WIDTH // 2, buf_ysize=self.HEIGHT // 2)
        self.assertEqual(self.asked(), [])

    def test_what_the_raster_has_not_is_refused(self):
        dataset = self.open()
        for window in ((-1, 0, 10, 10), (0, 0, self.WIDTH + 1, 10), (0, 1690, 10, 11)):
            self.assert_fails("no such window", lambda: dataset.AdviseRead(*window))

    def test_a_failure_is_told(self):
        dataset = self.open()
        self.server.fault = lambda handler: 500
        self.assert_fails("500", lambda: dataset.AdviseRead(0, 0, 500, 500))

    def test_files_on_disk_are_left_alone(self):
        gdal.Open(self.file).AdviseRead(0, 0, 500, 500)


class Names(ServedTest):
    def check(self, name):
        dataset = self.open(name)
        self.check_window(dataset)
        np.testing.assert_array_equal(dataset.ReadAsArray(buf_xsize=self.WIDTH // 2,
                                                          buf_ysize=self.HEIGHT // 2),
                                      halve(self.array))
        self.assertEqual(dataset.GetGeoTransform()[1] if self.placed else 30, 30)
        plain = gdal.Open(self.file)
        self.assertEqual(dataset.GetRasterBand(1).GetStatistics(False, False),
                         plain.GetRasterBand(1).GetStatistics(False, False))
        return dataset

    placed = True

    def test_a_plain_url_is_read_in_parts(self):
        dataset = self.open(self.server.url + "scene.pyr")
        self.assertEqual(self.asked(), [("GET", "/scene.pyr", FRONT)])
        self.check_window(dataset)
        self.assertEqual(len(self.asked()), 4)
        self.check(self.server.url + "scene.pyr")

    def test_a_plain_url_with_a_query(self):
        self.placed = False
        self.check(self.server.url + "scene.pyr?version=1")

    def test_a_plain_url_of_a_server_without_ranges_is_left_to_gdal(self):
        self.server.ranges = False
        self.check_window(self.open(self.server.url + "scene.pyr"))

    def test_a_plain_url_that_is_no_pyramid_is_no_error_of_ours(self):
        with open(self.path("text.pyr"), "w") as stream:
            stream.write("a text\n" * 5000)
        self.assertIsNone(gdal.IdentifyDriverEx(self.server.url + "text.tif", 0, ["ZMCPyramid"]))
        for name in ("text.pyr", "missing.pyr"):
            with self.assertRaises(RuntimeError):
                gdal.OpenEx(self.server.url + name, gdal.OF_RASTER, ["ZMCPyramid"])

    def test_read_from_the_beginning_on(self):
        self.placed = False
        self.check("/vsicurl_streaming/" + self.server.url + "scene.pyr")

    def test_in_an_archive_behind_a_url(self):
        self.placed = False
        for method in (zipfile.ZIP_STORED, zipfile.ZIP_DEFLATED):
            with zipfile.ZipFile(self.path(f"a{method}.zip"), "w", method) as archive:
                archive.write(self.file, "inner/scene.pyr")
            self.check(f"/vsizip//vsicurl/{self.server.url}a{method}.zip/inner/scene.pyr")
            self.check(f"/vsizip/{{/vsicurl/{self.server.url}a{method}.zip}}/inner/scene.pyr")

    def test_compressed_behind_a_url(self):
        self.placed = False
        with open(self.file, "rb") as stream, gzip.open(self.path("scene.pyr.gz"), "wb", 1) as out:
            out.write(stream.read())
        self.check("/vsigzip//vsicurl/" + self.server.url + "scene.pyr.gz")

    def test_inside_another_file_behind_a_url(self):
        self.placed = False
        with open(self.file, "rb") as stream:
            content = stream.read()
        with open(self.path("many.dat"), "wb") as stream:
            stream.write(b"x" * 1000 + content + b"y" * 1000)
        self.check(f"/vsisubfile/1000_{len(content)},{self.name[:-9]}many.dat")

    def test_in_an_object_store(self):
        os.mkdir(self.path("bucket"))
        os.rename(self.file, self.path("bucket/scene.pyr"))
        os.symlink(self.path("bucket/scene.pyr"), self.file)
        self.placed = False
        with Settings(AWS_S3_ENDPOINT=self.server.url[len("http://"):-1], AWS_HTTPS="NO",
                      AWS_VIRTUAL_HOSTING="FALSE", AWS_NO_SIGN_REQUEST="YES"):
            dataset = self.check("/vsis3/bucket/scene.pyr")
            self.server.take()
            self.check_window(dataset, 1300, 1000, 900, 600)
            # One for each row of tiles, and one that tells whether the file is the same.
            self.assertEqual(len(self.server.take()), 4 + 1)
            os.utime(self.path("bucket/scene.pyr"), (time.time() + 10,) * 2)
            self.assert_fails("has changed", lambda: dataset.ReadAsArray(0, 300, 500, 500))

    def test_behind_a_redirect(self):
        self.placed = False
        self.server.redirects["/moved.pyr"] = self.server.url + "scene.pyr"
        self.check("/vsicurl/" + self.server.url + "moved.pyr")
        self.check(self.server.url + "moved.pyr")

    def test_headers_of_the_settings_are_sent(self):
        with Settings(GDAL_HTTP_HEADERS="X-One: 1,X-Two: 2"):
            dataset = self.open()
            self.server.take()
            self.check_window(dataset)
        for request in self.server.take():
            self.assertEqual((request.headers.get("X-One"), request.headers.get("X-Two")),
                             ("1", "2"))


class Changes(ServedTest):
    """A file that changes on its server."""

    def check_swap(self):
        dataset = self.open()
        self.check_window(dataset, 0, 0, 300, 300)
        self.swap()
        for window in ((600, 600, 1024, 768), (0, 0, 600, 600), (0, 0, 2300, 1700)):
            self.assert_fails("has changed", lambda: dataset.ReadAsArray(*window))
        self.assert_fails("has changed", lambda: dataset.AdviseRead(600, 600, 500, 500))
        # What is held is of the file that was opened.
        self.check_window(dataset, 0, 0, 300, 300)
        gdal.VSICurlClearCache()
        np.testing.assert_array_equal(self.open().ReadAsArray(), self.other)

    def test_is_told_by_tag_and_date(self):
        self.check_swap()

    def test_is_told_by_the_tag_alone(self):
        self.server.dates = False
        self.check_swap()

    def test_is_told_by_the_date_alone(self):
        self.server.tags = False
        self.check_swap()

    def test_is_told_by_the_size_alone(self):
        self.server.tags = self.server.dates = False
        dataset = self.open()
        with open(self.file, "ab") as stream:
            stream.write(b"x")
        self.assert_fails("has changed", lambda: dataset.ReadAsArray(0, 0, 300, 300))

    def test_costs_no_request_to_notice(self):
        dataset = self.open()
        self.server.take()
        self.check_window(dataset)
        self.assertEqual({request.method for request in self.server.take()}, {"GET"})

    def test_between_the_opening_and_the_first_read(self):
        dataset = self.open()
        self.swap()
        self.assert_fails("has changed", lambda: dataset.ReadAsArray(600, 600, 300, 300))
        self.assertRaises(RuntimeError, lambda: dataset.GetRasterBand(1).GetStatistics(False, True))

    def test_within_a_window(self):
        dataset = self.open()
        self.server.take()

        def swap_at_third(handler):
            if handler.number == 3:
                self.swap()

        self.server.fault = swap_at_third
        self.assert_fails("has changed", lambda: dataset.ReadAsArray(600, 600, 1024, 768))

    def test_in_an_archive(self):
        def pack(name):
            with zipfile.ZipFile(self.path("new.zip"), "w") as archive:
                archive.write(name, "scene.pyr")
            os.replace(self.path("new.zip"), self.path("a.zip"))

        pack(self.file)
        dataset = self.open(f"/vsizip//vsicurl/{self.server.url}a.zip/scene.pyr")
        self.check_window(dataset, 0, 0, 300, 300)
        pack(self.take("other.pyr"))
        os.utime(self.path("a.zip"), (time.time() + 10,) * 2)
        self.assert_fails("has changed", lambda: dataset.ReadAsArray(600, 600, 1024, 768))


class Faults(ServedTest):
    def read(self, dataset):
        return dataset.ReadAsArray(600, 600, 1024, 768)

    def test_in_the_middle(self):
        for fault, reason in ((404, "404"), (500, "500"), (403, "403"), ("drop", "."),
                              ("short", "."), ("less", "less than it says"),
                              ("other", "another range")):
            dataset = self.open()
            self.server.take()
            self.server.fault = \
                lambda handler, fault=fault: fault if handler.number >= 2 else None
            self.assert_fails("cannot read it: .*" + reason, lambda: self.read(dataset))
            self.server.fault = None
            self.check_window(dataset)

    def test_at_the_opening(self):
        for fault in (404, 500, "drop", "short", "less", "other"):
            gdal.VSICurlClearCache()
            self.server.fault = lambda handler, fault=fault: fault
            with self.assertRaises(RuntimeError):
                self.open()
            self.server.fault = None
        gdal.VSICurlClearCache()
        self.check_window(self.open())

    def test_a_server_that_forgets_ranges(self):
        dataset = self.open()
        self.server.ranges = False
        self.server.take()
        self.assert_fails("does not give parts", lambda: self.read(dataset))
        self.assertLess(sum(request.sent for request in self.server.take()), 1 << 26)

    def test_a_server_without_ranges(self):
        self.server.ranges = False
        try:
            dataset = self.open()
        except RuntimeError as error:
            self.assertNotIn("\n", str(error))
        else:
            self.check_window(dataset)

    def test_a_server_that_lies_about_the_size(self):
        self.server.claims = 1 << 40
        dataset = self.open()
        self.check_window(dataset)
        self.assertEqual(dataset.GetRasterBand(1).ComputeRasterMinMax(False), (0, 255))
        # One that claims less serves a raster that lacks tiles.
        gdal.VSICurlClearCache()
        self.server.claims = 20000
        self.assertEqual(self.open().GetMetadataItem("COMPLETE", "ZMCPYRAMID"), "NO")

    def test_a_slow_server_is_not_waited_for_longer_than_is_set(self):
        dataset = self.open()
        self.server.delay = 5
        with Settings(GDAL_HTTP_TIMEOUT="1"):
            start = time.monotonic()
            self.assert_fails(".", lambda: self.read(dataset))
            self.assertLess(time.monotonic() - start, 4)

    def test_what_is_no_pyramid(self):
        for size in (0, 10, 1024, 20000):
            with open(self.path("bad.pyr"), "wb") as stream, open(self.file, "rb") as good:
                stream.write(good.read(40) if size else b"")
                stream.write(b"\0" * size)
            with self.assertRaises(RuntimeError):
                self.open("/vsicurl/" + self.server.url + "bad.pyr")
            gdal.VSICurlClearCache()

    def test_a_file_that_lacks_tiles(self):
        with open(self.file, "r+b") as stream:
            stream.truncate(os.path.getsize(self.file) // 2)
        dataset = self.open()
        plain = gdal.Open(self.file)
        np.testing.assert_array_equal(dataset.ReadAsArray(0, 0, 300, 256), self.array[:, :256, :300])
        for reader in (dataset, plain):
            with self.assertRaisesRegex(RuntimeError, "its file ends before the pixels"):
                reader.ReadAsArray()
        zeros = gdal.OpenEx(self.name, open_options=["MISSING=ZEROS"])
        np.testing.assert_array_equal(
            zeros.ReadAsArray(),
            gdal.OpenEx(self.file, open_options=["MISSING=ZEROS"]).ReadAsArray())

    def test_writing_is_refused(self):
        with self.assertRaises(RuntimeError):
            dataset = gdal.OpenEx(self.name, gdal.OF_UPDATE)
            dataset.GetRasterBand(1).WriteArray(self.array[0])
            dataset.FlushCache()


if __name__ == "__main__":
    unittest.main()
