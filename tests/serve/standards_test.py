"""The services of the OGC's standards, as programs of others use them."""
import io
import json
import os
import pathlib
import shutil
import subprocess
import tempfile
import unittest
import xml.etree.ElementTree as ElementTree

import numpy as np
from osgeo import gdal, osr

from server_test import TOOL, Pyramid, Server, geotiff, make_old, samples

gdal.SetConfigOption("GDAL_ENABLE_WMS_CACHE", "NO")
WMTS, OWS = "{http://www.opengis.net/wmts/1.0}", "{http://www.opengis.net/ows/1.1}"
XLINK = "{http://www.w3.org/1999/xlink}"
EDGE = 20037508.342789244
QGIS = subprocess.run(["/usr/bin/python3", "-c", "import qgis.core"], capture_output=True,
                      check=False).returncode == 0


def waves(height, width):
    """Three bands without sharp edges, so that methods of resampling hardly differ."""
    y, x = np.mgrid[0:height, 0:width]
    bands = [np.sin(x / 23) * np.cos(y / 31), np.sin((x + y) / 37), np.cos(x / 29 - y / 41)]
    return np.stack([(120 + 100 * band) for band in bands], axis=2).astype(np.uint8)


def picture(data):
    """Height x width x bands of a picture file."""
    name = "/vsimem/picture"
    gdal.FileFromMemBuffer(name, data)
    try:
        array = gdal.Open(name).ReadAsArray()
    finally:
        gdal.Unlink(name)
    return array[:, :, None] if array.ndim == 2 else np.moveaxis(array, 0, 2)


class StandardsTest(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.folder = tempfile.mkdtemp(prefix="zmcstandards")
        cls.addClassCleanup(shutil.rmtree, cls.folder)
        os.mkdir(os.path.join(cls.folder, "data"))
        cls.waves = waves(900, 1300)
        cls.noise = samples("Byte", 700, 900, 3)
        cls.build("waves.pyr", cls.waves, 32633, (400000, 30, 0, 5000000, 0, -30))
        cls.build("noise.pyr", cls.noise, 32633, (400000, 10, 0, 5000000, 0, -10))
        cls.build("degrees.pyr", cls.noise, 4326, (10, 0.01, 0, 50, 0, -0.01))
        cls.build("plain.pyr", cls.noise)
        cls.server = cls.enterClassContext(Server(os.path.join(cls.folder, "data")))
        cls.capabilities = cls.server.url + "wmts/1.0.0/WMTSCapabilities.xml"

    @classmethod
    def path(cls, name):
        return os.path.join(cls.folder, "data", name)

    @classmethod
    def build(cls, name, pixels, system=None, transform=None):
        source = geotiff(os.path.join(cls.folder, name + ".tif"), pixels)
        if system:
            dataset = gdal.Open(source, gdal.GA_Update)
            reference = osr.SpatialReference()
            reference.ImportFromEPSG(system)
            dataset.SetSpatialRef(reference)
            dataset.SetGeoTransform(transform)
            dataset = None
        subprocess.run([TOOL, "build", source, cls.path(name), "--overwrite", "-q"], check=True)
        for each in pathlib.Path(cls.folder, "data").iterdir():
            make_old(each)

    def open(self, layer, tiles, source=None):
        return gdal.Open(f"WMTS:{source or self.capabilities},layer={layer},tilematrixset={tiles}")

    def capabilities_of(self, name):
        return self.server.url + f"wmts/1.0.0/{name}/WMTSCapabilities.xml"

    def curl(self, path, *options):
        got = subprocess.run(["curl", "-sS", "-w", "\n%{http_code} %{content_type}", *options,
                              self.server.url + path], capture_output=True, check=True).stdout
        body, _, said = got.rpartition(b"\n")
        status, _, kind = said.decode().partition(" ")
        return int(status), kind, body

    # --- WMTS through GDAL ---

    def test_the_own_grid_has_the_samples_of_the_raster_at_every_level(self):
        dataset = self.open("noise.pyr", "own-noise.pyr")
        self.assertEqual((dataset.RasterXSize, dataset.RasterYSize), (900, 700))
        np.testing.assert_allclose(dataset.GetGeoTransform(), (400000, 10, 0, 5000000, 0, -10))
        self.assertEqual(dataset.GetSpatialRef().GetAuthorityCode(None), "32633")
        shown = dataset.ReadAsArray()
        np.testing.assert_array_equal(np.moveaxis(shown[:3], 0, 2), self.noise)
        self.assertTrue((shown[3] == 255).all())
        file = Pyramid(self.path("noise.pyr"))
        self.assertEqual(dataset.GetRasterBand(1).GetOverviewCount(), file.level_max)
        for level in range(1, file.level_max + 1):
            expected = file.read(level)
            height, width, _ = expected.shape
            for band in range(3):
                got = dataset.GetRasterBand(band + 1).GetOverview(level - 1).ReadAsArray()
                np.testing.assert_array_equal(got[:height, :width], expected[:, :, band])

    def test_tiles_by_keys_are_those_by_paths(self):
        text = self.server.get("/wmts?SERVICE=WMTS&REQUEST=GetCapabilities")[2].decode()
        root = ElementTree.fromstring(text)
        for layer in root.iter(WMTS + "Layer"):
            for resource in layer.findall(WMTS + "ResourceURL"):
                layer.remove(resource)
        path = os.path.join(self.folder, "by_keys.xml")
        ElementTree.ElementTree(root).write(path)
        dataset = self.open("noise.pyr", "own-noise.pyr", path)
        np.testing.assert_array_equal(np.moveaxis(dataset.ReadAsArray()[:3], 0, 2), self.noise)

    def test_systems_with_north_first_and_without_a_place_are_read_too(self):
        dataset = self.open("degrees.pyr", "own-degrees.pyr")
        np.testing.assert_allclose(dataset.GetGeoTransform(), (10, 0.01, 0, 50, 0, -0.01))
        np.testing.assert_array_equal(np.moveaxis(dataset.ReadAsArray()[:3], 0, 2), self.noise)
        dataset = self.open("plain.pyr", "own-plain.pyr")
        np.testing.assert_allclose(dataset.GetGeoTransform(), (0, 1, 0, 0, 0, -1))
        np.testing.assert_array_equal(np.moveaxis(dataset.ReadAsArray()[:3], 0, 2), self.noise)

    def test_web_mercator_is_what_gdalwarp_makes_of_the_file(self):
        dataset = self.open("waves.pyr", "WebMercatorQuad", self.capabilities_of("waves.pyr"))
        self.assertEqual(dataset.GetSpatialRef().GetAuthorityCode(None), "3857")
        source = os.path.join(self.folder, "waves.pyr.tif")
        step = dataset.GetGeoTransform()[1]
        # A place of the plane in the raster.
        point = osr.SpatialReference()
        point.ImportFromEPSG(32633)
        plane = osr.SpatialReference()
        plane.ImportFromEPSG(3857)
        x, y, _ = osr.CoordinateTransformation(point, plane).TransformPoint(419000, 4987000)
        for times in (1, 4, 16):
            cell = step * times
            left = -EDGE + np.floor((x + EDGE) / cell / 256) * 256 * cell
            top = EDGE - np.floor((EDGE - y) / cell / 256) * 256 * cell
            bounds = [left, top - 256 * cell, left + 256 * cell, top]
            expected = gdal.Warp("", source, format="MEM", dstSRS="EPSG:3857", outputBounds=bounds,
                                 width=256, height=256, resampleAlg="bilinear",
                                 dstAlpha=True).ReadAsArray().astype(int)
            zoom = round(np.log2(2 * EDGE / 256 / cell))
            column, row = round((left + EDGE) / cell / 256), round((EDGE - top) / cell / 256)
            tile = picture(self.server.get(
                f"/wmts/1.0.0/waves.pyr/default/WebMercatorQuad/{zoom}/{row}/{column}.png")[2])
            with self.subTest(zoom=zoom):
                got = np.moveaxis(tile, 2, 0).astype(int)
                if len(got) == 3:
                    got = np.concatenate([got, np.full((1, 256, 256), 255)])
                inside = (got[3] == 255) & (expected[3] == 255)
                self.assertGreater(inside.sum(), 2000)
                # Along the edges of the raster one has a pixel that the other has not.
                self.assertLess(((got[3] > 0) != (expected[3] > 0)).sum(), 600)
                difference = np.abs(got[:3] - expected[:3])[:, inside]
                # Levels are means already, and so a little softer; but nothing lies elsewhere.
                self.assertLess(difference.mean(), 1.5)
                self.assertLessEqual(np.percentile(difference, 99), 6)
                for axis in (1, 2):
                    moved = np.abs(np.roll(got, 1, axis)[:3] - expected[:3])[:, inside]
                    self.assertGreater(moved.mean(), 2 * difference.mean())
        # The whole, read as GDAL puts the tiles together.
        shown = dataset.ReadAsArray(0, 0, dataset.RasterXSize, dataset.RasterYSize, buf_xsize=200,
                                    buf_ysize=200)
        self.assertGreater((shown[3] > 0).mean(), 0.3)

    def test_every_zoom_shows_the_raster_where_it_lies(self):
        dataset = self.open("noise.pyr", "WebMercatorQuad", self.capabilities_of("noise.pyr"))
        limits = json.loads(self.server.get(
            "/ogc/collections/noise.pyr/map/tiles/WebMercatorQuad")[2])["tileMatrixSetLimits"]
        self.assertAlmostEqual(dataset.GetGeoTransform()[1],
                               2 * EDGE / 256 / 2 ** int(limits[-1]["tileMatrix"]), places=9)
        for limit in limits:
            shown = 0
            for row in range(limit["minTileRow"], limit["maxTileRow"] + 1):
                for column in range(limit["minTileCol"], limit["maxTileCol"] + 1):
                    tile = picture(self.server.get(
                        "/ogc/collections/noise.pyr/map/tiles/WebMercatorQuad/"
                        f"{limit['tileMatrix']}/{row}/{column}?f=png")[2])
                    shown += (tile[:, :, -1] > 0).sum() if tile.shape[2] in (2, 4) else 65536
            cell = 2 * EDGE / 256 / 2 ** int(limit["tileMatrix"])
            # 9 km x 7 km in 45 degrees north, where the plane is stretched by 1.41.
            pixels = 9000 * 7000 * 2 / cell ** 2
            if pixels > 100:
                self.assertAlmostEqual(shown / pixels, 1, delta=0.15 + 4 / pixels ** 0.5)

    def test_pixels_without_data_are_transparent_and_lend_nothing_to_others(self):
        pixels = np.full((400, 400, 1), 200, np.uint8)
        pixels[100:250, 150:300] = 0
        self.addCleanup(lambda: [each.unlink() for each in
                                 pathlib.Path(self.folder, "data").glob("holes.pyr*")])
        self.build("holes.pyr", pixels, 32633, (400000, 10, 0, 5000000, 0, -10))
        limits = json.loads(self.server.get(
            "/ogc/collections/holes.pyr/map/tiles/WebMercatorQuad")[2])["tileMatrixSetLimits"]
        for limit, method in ((limits[-1], "bilinear"), (limits[-1], "cubic"),
                              (limits[-3], "bilinear"), (limits[-2], "nearest")):
            shown = empty = 0
            for row in range(limit["minTileRow"], limit["maxTileRow"] + 1):
                for column in range(limit["minTileCol"], limit["maxTileCol"] + 1):
                    tile = picture(self.server.get(
                        f"/ogc/collections/holes.pyr/map/tiles/WebMercatorQuad/"
                        f"{limit['tileMatrix']}/{row}/{column}?f=png&nodata=0&stretch=none"
                        f"&resampling={method}")[2])
                    if tile.shape[2] == 1:
                        tile = np.concatenate([tile, np.full_like(tile, 255)], axis=2)
                    seen = tile[:, :, 1] > 0
                    shown += seen.sum()
                    empty += (~seen).sum()
                    # 199: of a sum of weights times 200.
                    self.assertTrue((np.abs(tile[seen][:, 0].astype(int) - 200) <= 1).all())
            cell = 2 * EDGE / 256 / 2 ** int(limit["tileMatrix"])
            pixels_shown = (4000 * 4000 - 1500 * 1500) * 2 / cell ** 2
            self.assertAlmostEqual(shown / pixels_shown, 1, delta=0.08)
            self.assertGreater(empty, 0)

    def test_values_of_a_place_are_those_of_the_raster(self):
        dataset = self.open("noise.pyr", "own-noise.pyr")
        told = dataset.GetRasterBand(1).GetMetadataItem("Pixel_301_257", "LocationInfo")
        for value in self.noise[257, 301]:
            self.assertIn(str(value), told)

    # --- documents ---

    def children(self, element):
        return [child.tag.rpartition("}")[2] for child in element]

    def test_capabilities_have_the_order_and_parts_of_the_standard(self):
        status, headers, body = self.server.get("/wmts?request=GetCapabilities&service=WMTS")
        self.assertEqual((status, headers["Content-Type"]), (200, "application/xml"))
        self.assertEqual(body, self.server.get("/wmts/1.0.0/WMTSCapabilities.xml")[2])
        root = ElementTree.fromstring(body)
        self.assertEqual((root.tag, root.get("version")), (WMTS + "Capabilities", "1.0.0"))
        self.assertEqual(self.children(root), ["ServiceIdentification", "OperationsMetadata",
                                               "Contents", "ServiceMetadataURL"])
        identification = root.find(OWS + "ServiceIdentification")
        self.assertEqual(identification.findtext(OWS + "ServiceType"), "OGC WMTS")
        self.assertEqual(identification.findtext(OWS + "ServiceTypeVersion"), "1.0.0")
        operations = root.find(OWS + "OperationsMetadata")
        self.assertEqual([each.get("name") for each in operations],
                         ["GetCapabilities", "GetTile", "GetFeatureInfo"])
        for get in operations.iter(OWS + "Get"):
            self.assertTrue(get.get(XLINK + "href").startswith(self.server.url + "wmts"))
            self.assertEqual(get.find(OWS + "Constraint").get("name"), "GetEncoding")
        sets = {each.findtext(OWS + "Identifier"): each
                for each in root.iter(WMTS + "TileMatrixSet") if len(each)}
        self.assertEqual(set(sets), {"own-waves.pyr", "own-noise.pyr", "own-degrees.pyr",
                                     "own-plain.pyr", "WebMercatorQuad"})
        self.check_sets(sets)
        for layer in root.iter(WMTS + "Layer"):
            self.check_layer(layer, sets)

    def check_sets(self, sets):
        for tiles in sets.values():
            names = self.children(tiles)
            matrices = tiles.findall(WMTS + "TileMatrix")
            self.assertEqual(names[:3], ["Title", "Identifier", "SupportedCRS"])
            self.assertEqual(names[-len(matrices):], ["TileMatrix"] * len(matrices))
            scales = [float(each.findtext(WMTS + "ScaleDenominator")) for each in matrices]
            self.assertEqual(scales, sorted(scales, reverse=True))
            for matrix in matrices:
                self.assertEqual(self.children(matrix),
                                 ["Identifier", "ScaleDenominator", "TopLeftCorner", "TileWidth",
                                  "TileHeight", "MatrixWidth", "MatrixHeight"])
                self.assertEqual(len(matrix.findtext(WMTS + "TopLeftCorner").split(" ")), 2)
                self.assertGreater(int(matrix.findtext(WMTS + "MatrixWidth")), 0)
        mercator = sets["WebMercatorQuad"]
        self.assertEqual(mercator.findtext(WMTS + "WellKnownScaleSet"),
                         "urn:ogc:def:wkss:OGC:1.0:GoogleMapsCompatible")
        self.assertEqual(mercator.findtext(OWS + "SupportedCRS"), "urn:ogc:def:crs:EPSG::3857")

    def check_layer(self, layer, sets):
        order = ["Title", "WGS84BoundingBox", "Identifier", "BoundingBox", "Style", "Format",
                 "InfoFormat", "TileMatrixSetLink", "ResourceURL"]
        names = self.children(layer)
        self.assertEqual(names, sorted(names, key=order.index))
        self.assertEqual("WGS84BoundingBox" in names,
                         layer.findtext(OWS + "Identifier") != "plain.pyr")
        style = layer.find(WMTS + "Style")
        self.assertEqual((style.get("isDefault"), style.findtext(OWS + "Identifier")),
                         ("true", "default"))
        self.assertEqual([each.text for each in layer.findall(WMTS + "Format")],
                         ["image/png", "image/jpeg", "image/webp"])
        for link in layer.findall(WMTS + "TileMatrixSetLink"):
            tiles = sets[link.findtext(WMTS + "TileMatrixSet")]
            known = {each.findtext(OWS + "Identifier"): each
                     for each in tiles.findall(WMTS + "TileMatrix")}
            for limit in link.iter(WMTS + "TileMatrixLimits"):
                matrix = known[limit.findtext(WMTS + "TileMatrix")]
                for part, size in (("Row", "Height"), ("Col", "Width")):
                    first = int(limit.findtext(f"{WMTS}MinTile{part}"))
                    last = int(limit.findtext(f"{WMTS}MaxTile{part}"))
                    self.assertLessEqual(0, first)
                    self.assertLessEqual(first, last)
                    self.assertLess(last, int(matrix.findtext(f"{WMTS}Matrix{size}")))
        for resource in layer.findall(WMTS + "ResourceURL"):
            address = resource.get("template")
            for name, value in (("Style", "default"), ("TileMatrix", "0"), ("TileRow", "0"),
                                ("TileCol", "0"), ("I", "0"), ("J", "0"),
                                ("TileMatrixSet", "own-" + layer.findtext(OWS + "Identifier"))):
                address = address.replace("{" + name + "}", value)
            status, headers, _ = self.server.get(address[len(self.server.url) - 1:])
            self.assertEqual(status, 200, address)
            self.assertEqual(headers["Content-Type"].split(";")[0], resource.get("format"))

    def test_faults_are_reports_of_the_standard(self):
        status, kind, body = self.curl("wmts?SERVICE=WMTS&REQUEST=GetTile&VERSION=1.0.0")
        self.assertEqual((status, kind), (400, "application/xml"))
        root = ElementTree.fromstring(body)
        self.assertEqual((root.tag, root.get("version")), (OWS + "ExceptionReport", "1.1.0"))
        fault = root.find(OWS + "Exception")
        self.assertEqual((fault.get("exceptionCode"), fault.get("locator")),
                         ("MissingParameterValue", "Layer"))
        self.assertTrue(fault.findtext(OWS + "ExceptionText"))

    def test_addresses_begin_as_the_client_calls_the_server_and_hold_nothing_else_of_it(self):
        for host, begin in (("maps.example:81", "http://maps.example:81/"),
                            ("a\"b<c>", self.server.url)):
            body = self.curl("wmts/1.0.0/WMTSCapabilities.xml", "-H", f"Host: {host}",
                             "-H", "X-Forwarded-Host: evil.example",
                             "-H", "X-Forwarded-Proto: gopher")[2].decode()
            self.assertIn(f'xlink:href="{begin}wmts?"', body)
            self.assertNotIn("evil", body)
            self.assertNotIn("gopher", body)
            ElementTree.fromstring(body)
        with Server(os.path.join(self.folder, "data"), "--base-url", "https://a.b/c&d") as server:
            body = server.get("/wmts/1.0.0/WMTSCapabilities.xml")[2].decode()
            self.assertIn('xlink:href="https://a.b/c&amp;d/wmts?"', body)
            landing = json.loads(server.get("/ogc")[2])
            self.assertTrue(landing["links"][0]["href"].startswith("https://a.b/c&d/ogc"))

    # --- OGC API - Tiles ---

    def test_from_the_landing_page_links_lead_to_a_tile(self):
        def follow(document, relation):
            href = [link["href"] for link in document["links"] if link["rel"] == relation][0]
            return json.loads(self.curl(href[len(self.server.url):])[2])
        rel = "http://www.opengis.net/def/rel/ogc/1.0/"
        landing = json.loads(self.curl("ogc")[2])
        collections = follow(landing, rel + "data")["collections"]
        noise = [each for each in collections if each["id"] == "noise.pyr"][0]
        own = follow(noise, rel + "tilesets-map")["tilesets"][0]
        tileset = follow(own, "self")
        matrix = follow(tileset, rel + "tiling-scheme")["tileMatrices"][-1]
        item = [link for link in tileset["links"] if link["rel"] == "item"][0]
        address = (item["href"].replace("{tileMatrix}", matrix["id"])
                   .replace("{tileRow}", "1").replace("{tileCol}", "2"))
        status, kind, body = self.curl(address[len(self.server.url):])
        self.assertEqual((status, kind), (200, "image/png"))
        np.testing.assert_array_equal(picture(body)[:, :, :3], self.noise[256:512, 512:768])

    def test_tiles_have_the_format_that_is_asked_for(self):
        tile = "ogc/collections/waves.pyr/map/tiles/WebMercatorQuad/0/0/0"
        for options, query, expected in ((("-H", "Accept: image/webp"), "", "image/webp"),
                                         (("-H", "Accept: image/jpeg, */*;q=0.1"), "",
                                          "image/jpeg"),
                                         ((), "?f=jpg", "image/jpeg"), ((), "", "image/png")):
            status, kind, _ = self.curl(tile + query, *options)
            self.assertEqual((status, kind), (200, expected))
        status, kind, body = self.curl(tile, "-H", "Accept: application/pdf")
        self.assertEqual((status, kind), (406, "text/plain; charset=utf-8"))
        self.assertEqual(body.count(b"\n"), 1)
        # Where there is no raster, JPEG is white.
        white = picture(self.curl("ogc/collections/waves.pyr/map/tiles/WebMercatorQuad/3/0/0"
                                  "?f=jpeg")[2])
        self.assertTrue((white == 255).all())

    # --- QGIS ---

    @unittest.skipUnless(QGIS, "QGIS is not installed")
    def test_qgis_shows_the_layers(self):
        script = pathlib.Path(__file__).with_name("qgis_wmts.py")
        target = os.path.join(self.folder, "shown.png")
        environment = dict(os.environ, QT_QPA_PLATFORM="offscreen", HOME=self.folder,
                           XDG_RUNTIME_DIR=self.folder)
        for tiles, system, extent in (
                ("own-noise.pyr", "EPSG:32633", (400000, 4993000, 409000, 5000000)),
                ("WebMercatorQuad", "EPSG:3857", None)):
            extent_words = [str(number) for number in extent or ()]
            done = subprocess.run(["/usr/bin/python3", "-B", script, self.capabilities,
                                   "noise.pyr" if extent else "waves.pyr", tiles, system, target,
                                   *extent_words], env=environment, capture_output=True,
                                  timeout=120, check=False)
            self.assertEqual(done.returncode, 0, done.stderr.decode()[-2000:])
            shown = picture(pathlib.Path(target).read_bytes())
            if extent:
                np.testing.assert_array_equal(shown[:, :, :3], self.noise)
            else:
                self.assertGreater(len(np.unique(shown[:, :, 0])), 100)


if __name__ == "__main__":
    unittest.main()
