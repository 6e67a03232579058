"""Pictures of rasters, read back through GDAL and compared with the formula in numpy."""
import os
import re
import signal
import stat
import subprocess
import sys
import time
import unittest
import zipfile

import numpy as np
from osgeo import gdal

from frame import TOOL, TYPES, ToolTest, geotiff, samples

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "gdal"))
from server import Server  # noqa: E402


def levels(values, minimum, maximum, gamma=1.0):
    t = np.clip((values - minimum) / (maximum - minimum), 0, 1) ** (1 / gamma)
    return np.floor(255 * t + 0.5).astype(np.uint8)


class Preview(ToolTest):
    def read(self, name):
        pixels = gdal.Open(self.path(name)).ReadAsArray()
        return np.moveaxis(pixels if pixels.ndim == 3 else pixels[None], 0, -1)

    def made(self, *words, name="out.png"):
        """The pixels of a preview, with a last dimension of channels."""
        self.good("preview", *words[:1], name, "--overwrite", *words[1:])
        return self.read(name)

    def raster(self, name, pixels, type_name="Byte", **more):
        geotiff(self.path("source.tif"), pixels, type_name, **more)
        self.good("build", "source.tif", name, "--overwrite")

    def test_bytes_are_shown_as_they_are(self):
        pixels = self.pyramid()
        np.testing.assert_array_equal(self.made("picture.pyr"), pixels)
        self.assertEqual(self.good("preview", "picture.pyr", "a.png"),
                         "a.png: 700 x 300 pixels of picture.pyr\n")

    def test_every_type_follows_the_formula(self):
        for name in TYPES:
            with self.subTest(name):
                pixels = samples(name, 40, 60, 1)
                self.raster("made.pyr", pixels, name)
                shown = self.made("made.pyr", "--stretch", "-1000,3000", "--gamma", "2.2")
                values = np.abs(pixels) if np.iscomplexobj(pixels) else pixels
                expected = levels(values.astype(np.float64), -1000, 3000, 2.2)
                self.assertLessEqual(np.abs(shown[:, :, :1].astype(int) - expected).max(), 1)

    def test_formats_go_by_the_ending(self):
        self.pyramid()
        for ending, driver in (("jpg", "JPEG"), ("JPEG", "JPEG"), ("png", "PNG"), ("webp", "WEBP")):
            name = "out." + ending
            self.good("preview", "picture.pyr", name, "--size", 100)
            dataset = gdal.Open(self.path(name))
            self.assertEqual((dataset.GetDriver().ShortName, dataset.RasterXSize,
                              dataset.RasterYSize), (driver, 100, 43))
        for name in ("out.gif", "out", ".png", "png"):
            self.refused(2, f"{name}: its ending is none of jpg, jpeg, png, webp", "preview",
                         "picture.pyr", name)

    def test_size_and_window(self):
        pixels = self.pyramid()
        for words, shape in (([], (300, 700)), (["--size", 1400], (600, 1400)),
                             (["--size", 70], (30, 70)), (["--size", 1], (1, 1)),
                             (["--window", "10,20,100,200"], (200, 100)),
                             (["--window", "10,20,100,200", "--size", 20], (20, 10))):
            self.assertEqual(self.made("picture.pyr", *words).shape, shape + (3,))
        np.testing.assert_array_equal(self.made("picture.pyr", "--window", "10,20,100,200"),
                                      pixels[20:220, 10:110])

    def test_a_large_raster_is_shown_in_the_usual_size(self):
        self.picture(width=3000, height=1000)
        self.good("build", "picture.tif", "picture.pyr")
        self.assertEqual(self.made("picture.pyr").shape, (341, 1024, 3))

    def test_levels_are_averages_of_the_finest(self):
        pixels = np.repeat(np.repeat(samples("Byte", 32, 32, 1), 8, 0), 8, 1)
        self.raster("made.pyr", pixels)
        shown = self.made("made.pyr", "--size", 32, "--stretch", "none")
        np.testing.assert_array_equal(shown, pixels[::8, ::8])

    def test_no_data_of_the_sidecar_is_transparent(self):
        pixels = samples("Int16", 20, 30, 1) // 100
        pixels[5, 7] = -999
        self.raster("made.pyr", pixels, "Int16", nodata=-999)
        shown = self.made("made.pyr", "--stretch", "-300,300")
        self.assertEqual(shown.shape[2], 2)
        np.testing.assert_array_equal(shown[:, :, 1], np.where(pixels[:, :, 0] == -999, 0, 255))
        self.assertEqual(self.made("made.pyr", "--nodata", "none").shape[2], 1)

    def test_a_palette_of_the_file_is_shown(self):
        colors = [(10, 20, 30, 255), (200, 100, 50, 255), (0, 255, 0, 255)]
        pixels = (samples("Byte", 20, 30, 1) % 3).astype(np.uint8)
        self.raster("made.pyr", pixels, colors=colors)
        expected = np.array(colors, np.uint8)[pixels[:, :, 0]][:, :, :3]
        np.testing.assert_array_equal(self.made("made.pyr")[:, :, :3], expected)
        np.testing.assert_array_equal(self.made("made.pyr", "--stretch", "none"), pixels)

    def test_alpha_is_what_the_raster_says(self):
        pixels = samples("Byte", 20, 30, 4)
        geotiff(self.path("source.tif"), pixels, options=["PHOTOMETRIC=RGB", "ALPHA=YES"])
        self.good("build", "source.tif", "made.pyr")
        np.testing.assert_array_equal(self.made("made.pyr"), pixels)

    def test_a_mask_of_the_dataset_hides(self):
        self.picture()
        dataset = gdal.Open(self.path("picture.tif"), gdal.GA_Update)
        dataset.CreateMaskBand(gdal.GMF_PER_DATASET)
        mask = np.full((300, 700), 255, np.uint8)
        mask[:100, :300] = 0
        dataset.GetRasterBand(1).GetMaskBand().WriteArray(mask)
        dataset = None
        for name in ("picture.tif", "picture.pyr"):
            if name == "picture.pyr":
                self.good("build", "picture.tif", "picture.pyr")
            with self.subTest(name):
                np.testing.assert_array_equal(self.made(name)[:, :, 3], mask)

    def test_the_usual_stretch_is_that_of_the_histogram(self):
        pixels = samples("UInt16", 100, 100, 1)
        self.raster("made.pyr", pixels, "UInt16")
        document = self.document("preview", "made.pyr", "out.png")
        self.assertShape(document, {"schema": int, "file": str, "picture": str, "width": int,
                                    "height": int, "channels": int, "window": [int],
                                    "stretch": [[int]]})
        low, high = np.percentile(pixels, [2, 98])
        self.assertLess(abs(document["stretch"][0][0] - low), 300)
        self.assertLess(abs(document["stretch"][0][1] - high), 300)
        np.testing.assert_array_equal(self.read("out.png"),
                                      levels(pixels.astype(float), *document["stretch"][0]))

    def test_an_expression_of_bands(self):
        pixels = samples("Byte", 30, 30, 4)
        self.raster("made.pyr", pixels)
        shown = self.made("made.pyr", "--expression", "(b4-b3)/(b4+b3)", "--stretch", "-1,1")
        red, near = pixels[:, :, 2].astype(float), pixels[:, :, 3].astype(float)
        there = red + near != 0
        expected = levels((near - red)[there] / (near + red)[there], -1, 1)
        self.assertLessEqual(np.abs(shown[there][:, 0].astype(int) - expected).max(), 1)

    def test_sixteen_bits_of_a_png_are_exact(self):
        pixels = samples("UInt16", 30, 40, 3)
        self.raster("made.pyr", pixels, "UInt16")
        shown = self.made("made.pyr", "--depth", "16", "--stretch", "none")
        self.assertEqual(shown.dtype, np.uint16)
        np.testing.assert_array_equal(shown, pixels)

    def test_a_legend_and_hillshade(self):
        y, x = np.mgrid[0:60, 0:200]
        pixels = (np.sin(x / 9) * np.cos(y / 7) * 20).astype(np.float32)[:, :, None]
        self.raster("made.pyr", pixels, "Single")
        plain = self.made("made.pyr", "--colormap", "viridis")
        whole = self.made("made.pyr", "--colormap", "viridis", "--legend")
        self.assertGreater(whole.shape[0], 60)
        np.testing.assert_array_equal(whole[:60], plain)
        shade = self.made("made.pyr", "--hillshade")
        self.assertEqual(shade.shape, (60, 200, 1))
        self.assertGreater(shade.std(), 20)
        lit = self.made("made.pyr", "--hillshade", "--colormap", "viridis")
        self.assertEqual(lit.shape, (60, 200, 3))

    def test_any_raster_of_gdal_is_shown(self):
        pixels = self.picture()
        np.testing.assert_array_equal(self.made("picture.tif"), pixels)
        self.assertEqual(self.made("picture.tif", "--size", 35).shape, (15, 35, 3))

    def test_names_elsewhere(self):
        self.pyramid()
        expected = self.made("picture.pyr", "--stretch", "p5,90", "--size", 100)
        with zipfile.ZipFile(self.path("a.zip"), "w") as archive:
            archive.write(self.path("picture.pyr"), "in/picture.pyr")
        server = Server(os.path.dirname(self.path("a.zip")))
        self.addCleanup(server.stop)
        for name in (f"/vsizip/{self.path('a.zip')}/in/picture.pyr", server.url + "picture.pyr",
                     "/vsicurl/" + server.url + "picture.pyr"):
            np.testing.assert_array_equal(
                self.made(name, "--stretch", "p5,90", "--size", 100), expected)

    def test_what_is_refused(self):
        self.pyramid()
        for words, message in (
                (["--size", "0"], "--size: a picture has a pixel at least"),
                (["--size", "16385"], "--size: 16385 is more than 16384"),
                (["--size", "-1"], '--size: "-1" is no whole number'),
                (["--quality", "0"], "--quality: it is a number from 1 to 100"),
                (["--quality", "101"], "--quality: 101 is more than 100"),
                (["--bands", "4"], "--bands: there is no band 4; the raster has 3"),
                (["--bands", "x"], '--bands: "x" is no band, which count from 1'),
                (["--stretch", "5"], '--stretch: "5" is no pair MIN,MAX'),
                (["--gamma", "0"], '--gamma: "0" is not from 0.01 to 100'),
                (["--colormap", "palette"], "--colormap: the band has no palette"),
                (["--bands", "1,2,3", "--colormap", "turbo"],
                 "--colormap: it is for one band, not three"),
                (["--expression", "b1+"],
                 "--expression: its end stands where a number, a band or a parenthesis is expected"),
                (["--hillshade", "--expression", "b1"],
                 "--expression: it does not go with hillshade"),
                (["--depth", "9"], '--depth: "9" is neither 8 nor 16')):
            self.refused(2, message, "preview", "picture.pyr", "out.png", *words)
        done = self.run_tool("preview", "picture.pyr", "out.png", "--window", "600,0,200,10")
        self.assertEqual((done.returncode, done.stderr.count("\n")), (2, 1))
        self.refused(1, "none.pyr: there is no such file", "preview", "none.pyr", "out.png")
        self.assertEqual(self.files(), ["picture.pyr", "picture.tif"])

    def test_a_size_is_bounded_by_the_format(self):
        self.pyramid()
        self.refused(2, "--size: 16384 is more than 16383", "preview", "picture.pyr", "out.webp",
                     "--size", "16384")

    def test_a_picture_is_replaced_only_when_that_is_asked_for(self):
        self.pyramid()
        with open(self.path("out.png"), "w") as file:
            file.write("mine")
        os.chmod(self.path("out.png"), 0o640)
        self.refused(1, "out.png: cannot build it: the file exists already", "preview",
                     "picture.pyr", "out.png")
        self.refused(2, '--gamma: "x" is no number', "preview", "picture.pyr", "out.png",
                     "--overwrite", "--gamma", "x")
        with open(self.path("out.png")) as file:
            self.assertEqual(file.read(), "mine")
        self.good("preview", "picture.pyr", "out.png", "--overwrite")
        self.assertEqual(stat.S_IMODE(os.stat(self.path("out.png")).st_mode), 0o640)
        self.assertEqual(self.files(), ["out.png", "picture.pyr", "picture.tif"])

    def test_the_raster_itself_is_never_replaced(self):
        self.picture("picture.tif")
        gdal.Translate(self.path("a.png"), self.path("picture.tif"), format="PNG").FlushCache()
        with open(self.path("a.png"), "rb") as file:
            before = file.read()
        self.refused(1, "a.png: it is the raster itself; name another file", "preview", "a.png",
                     "a.png", "--overwrite")
        with open(self.path("a.png"), "rb") as file:
            self.assertEqual(file.read(), before)

    def test_what_is_no_file_is_no_picture(self):
        self.pyramid()
        os.mkfifo(self.path("pipe.png"))
        os.mkdir(self.path("folder.png"))
        self.refused(1, "pipe.png: it is not a regular file", "preview", "picture.pyr", "pipe.png",
                     "--overwrite")
        self.refused(1, "folder.png: cannot replace it: it is a folder", "preview", "picture.pyr",
                     "folder.png", "--overwrite")
        self.refused(1, "pipe.png: it is not a regular file", "preview", "pipe.png", "out.png")

    def test_an_incomplete_pyramid_is_refused_and_leaves_nothing(self):
        self.pyramid()
        os.truncate(self.path("picture.pyr"), 400000)
        done = self.run_tool("preview", "picture.pyr", "out.png", "--quiet")
        self.assertEqual((done.returncode, done.stdout), (1, ""))
        self.assertRegex(done.stderr, r"^zmcraster: picture.pyr: cannot read [^\n]+ is incomplete,"
                                      r" [^\n]+\n$")
        self.assertEqual(self.files(), ["picture.pyr", "picture.tif"])

    def test_a_pyramid_whose_levels_have_all_shrunk_to_nothing_is_refused(self):
        self.pyramid()
        with open(self.path("picture.pyr"), "rb") as file:
            data = file.read()
        for name in (b"MIN", b"MAX"):
            data, count = re.subn(rb"(<HEADER_LEVEL" + name + rb">\s*)\d", rb"\g<1>9", data)
            self.assertEqual(count, 1)
        with open(self.path("empty.pyr"), "wb") as file:
            file.write(data)
        self.refused(1, "empty.pyr: none of its levels has a pixel to show", "preview", "empty.pyr",
                     "out.png", "--quiet")
        self.assertEqual(self.files(), ["empty.pyr", "picture.pyr", "picture.tif"])

    def test_a_preview_that_is_interrupted_leaves_no_picture(self):
        self.picture(width=6000, height=4000)
        running = subprocess.Popen([TOOL, "preview", "picture.tif", "out.png", "--size", "6000"],
                                   cwd=self.folder, stdout=subprocess.DEVNULL,
                                   stderr=subprocess.PIPE, text=True)
        # From here on the signal is caught: the draft of the picture is there.
        while running.poll() is None and len(self.files()) == 1:
            time.sleep(0.001)
        running.send_signal(signal.SIGINT)
        _, message = running.communicate(timeout=60)
        self.assertEqual(running.returncode, 130, message)
        self.assertRegex(message, r"^zmcraster: (picture.tif|out.png): interrupted\n$")
        self.assertEqual(self.files(), ["picture.tif"])

    def test_help_names_every_colour_map(self):
        maps = os.path.join(os.path.dirname(__file__), "../../render/colormaps.txt")
        text = self.good("preview", "--help")
        with open(maps) as file:
            for line in file:
                if not line.startswith("#"):
                    self.assertRegex(text, rf"\b{line.split()[0]}\b")


if __name__ == "__main__":
    unittest.main()
