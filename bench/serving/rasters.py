"""One raster in the form that each server likes best, and the requests for its tiles."""
import collections
import json
import os
import random
import subprocess
import sys
import urllib.request

from osgeo import gdal

BENCH = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
sys.path[:0] = [BENCH, os.path.join(BENCH, "..", "tests", "tools")]
from build_vs_cog import make_source  # noqa: E402
from pyramid import Pyramid  # noqa: E402

gdal.UseExceptions()
SIDE = 256

# Of a tile of the finest level: its column and row, and the address that each server knows it by.
Request = collections.namedtuple("Request", "path headers", defaults=({},))


def make(folder, tool, width):
    """scene.pyr, the same as tiled TIFFs with levels, and as COGs."""
    height = width * 3 // 4
    source = os.path.join(folder, "source.tif")
    if not os.path.exists(source):
        make_source(source, width, height)
    path = os.path.join(folder, "data", "scene.pyr")
    if not os.path.exists(path):
        subprocess.run([tool, "build", source, path, "-q"], check=True)
        os.utime(path, (0, 1e9))
    for name, compress in (("raw", "NONE"), ("jpeg", "JPEG")):
        tiled(source, os.path.join(folder, "data", f"tiled_{name}.tif"), compress)
    for name, compress in (("raw", "NONE"), ("deflate", "DEFLATE")):
        path = os.path.join(folder, "data", f"cog_{name}.tif")
        if not os.path.exists(path):
            gdal.Translate(path, source, format="COG", creationOptions=[
                "COMPRESS=" + compress, "BIGTIFF=YES", "NUM_THREADS=ALL_CPUS"])


def tiled(source, path, compress):
    if os.path.exists(path):
        return
    options = ["TILED=YES", f"BLOCKXSIZE={SIDE}", f"BLOCKYSIZE={SIDE}", "BIGTIFF=YES",
               "COMPRESS=" + compress, "NUM_THREADS=ALL_CPUS"]
    levels = {"COMPRESS_OVERVIEW": compress, "GDAL_TIFF_OVR_BLOCKSIZE": str(SIDE)}
    if compress == "JPEG":
        options += ["PHOTOMETRIC=YCBCR", "JPEG_QUALITY=85"]
        levels |= {"PHOTOMETRIC_OVERVIEW": "YCBCR", "JPEG_QUALITY_OVERVIEW": "85"}
    gdal.Translate(path, source, format="GTiff", creationOptions=options)
    for key, value in levels.items():
        gdal.SetConfigOption(key, value)
    dataset = gdal.Open(path, gdal.GA_Update)
    factors, size = [], max(dataset.RasterXSize, dataset.RasterYSize)
    while size > SIDE:
        factors.append(2 ** (len(factors) + 1))
        size //= 2
    dataset.BuildOverviews("AVERAGE", factors)
    dataset = None
    for key in levels:
        gdal.SetConfigOption(key, None)


class Grid:
    """The tiles of the finest level that are whole, in an order of their own that is always the same."""

    def __init__(self, url, folder, width):
        self.url = url
        self.folder = folder
        self.width, self.height = width, width * 3 // 4
        with urllib.request.urlopen(url + "tiles/scene.pyr/tile.json") as answer:
            self.zoom = json.load(answer)["maxzoom"]
        self.across, self.down = self.width // SIDE, self.height // SIDE
        self.tiles = [(x, y) for y in range(self.down) for x in range(self.across)]
        random.Random(1).shuffle(self.tiles)
        self.start = Pyramid(os.path.join(folder, "data", "scene.pyr")).offset(0)

    def offset(self, x, y):
        across = -(-self.width // SIDE)
        assert across == self.across, "the width is a multiple of a tile's side"
        return (y * across + x) * 3 * SIDE * SIDE

    def raw(self, x, y):
        with urllib.request.urlopen(f"{self.url}tiles/scene.pyr/{self.zoom}/{x}/{y}.raw") as answer:
            return answer.read()

    def served(self, ending):
        return [Request(f"/tiles/scene.pyr/{self.zoom}/{x}/{y}.{ending}") for x, y in self.tiles]

    def ranges(self, path):
        """The bytes of raw tiles as ranges of the file."""
        found = []
        for x, y in self.tiles:
            begin = self.start + self.offset(x, y)
            found.append(Request(path, {"Range": f"bytes={begin}-{begin + 3 * SIDE * SIDE - 1}"}))
        return found

    def iip(self, name):
        path = os.path.join(self.folder, "data", name)
        levels, size = 0, max(self.width, self.height)
        while size > SIDE:
            levels, size = levels + 1, size // 2
        return [Request(f"/iip?FIF={path}&JTL={levels},{y * self.across + x}")
                for x, y in self.tiles]

    def maps(self, name):
        """A map of the tile's pixels, one to one: no reprojection, no resampling."""
        found = []
        for x, y in self.tiles:
            left, bottom = x * SIDE, self.height - (y + 1) * SIDE
            # The extent goes from the middle of the first pixel to that of the last.
            extent = f"{left + .5}+{bottom + .5}+{left + SIDE - .5}+{bottom + SIDE - .5}"
            found.append(Request(f"/map?mode=map&layers={name}&mapsize={SIDE}+{SIDE}"
                                 f"&mapext={extent}"))
        return found
