"""What the tests of the command line share: running it, rasters to run it on, documents."""
import json
import os
import resource
import shutil
import subprocess
import tempfile
import unittest

import numpy as np
from osgeo import gdal

gdal.UseExceptions()
TOOL = os.environ["ZMC_TOOL"]

# A flag of bytes before GDAL 3.7.
SIGNED_BYTE = getattr(gdal, "GDT_Int8", gdal.GDT_Byte)
# GDAL's types and those of the pyramids that are built from them.
TYPES = {
    "Byte": (gdal.GDT_Byte, np.uint8), "Char": (SIGNED_BYTE, np.int8),
    "UInt16": (gdal.GDT_UInt16, np.uint16), "Int16": (gdal.GDT_Int16, np.int16),
    "UInt32": (gdal.GDT_UInt32, np.uint32), "Int32": (gdal.GDT_Int32, np.int32),
    "UInt64": (gdal.GDT_UInt64, np.uint64), "Int64": (gdal.GDT_Int64, np.int64),
    "Single": (gdal.GDT_Float32, np.float32), "Double": (gdal.GDT_Float64, np.float64),
    "ComplexSingle": (gdal.GDT_CFloat32, np.complex64),
    "ComplexDouble": (gdal.GDT_CFloat64, np.complex128),
}


def samples(type_name, height, width, bands, seed=1):
    """Samples over the whole range of a type, its ends among them; height x width x bands."""
    kind = TYPES[type_name][1]
    random = np.random.default_rng(seed)
    shape = (height, width, bands)
    if np.issubdtype(kind, np.complexfloating):
        return (random.normal(0, 1e3, shape) + 1j * random.normal(0, 1e3, shape)).astype(kind)
    if np.issubdtype(kind, np.floating):
        return random.normal(0, 1e6, shape).astype(kind)
    limits = np.iinfo(kind)
    pixels = random.integers(limits.min, limits.max, shape, dtype=kind, endpoint=True)
    pixels[0, 0], pixels[-1, -1] = limits.min, limits.max
    return pixels


def no_new_threads():
    """For preexec_fn: the program can start none, as stacks would be larger than any memory."""
    resource.setrlimit(resource.RLIMIT_STACK, (1 << 50, resource.RLIM_INFINITY))


def geotiff(path, pixels, type_name="Byte", options=(), nodata=None, colors=None):
    height, width, bands = pixels.shape
    options = list(options)
    flagged = type_name == "Char" and SIGNED_BYTE == gdal.GDT_Byte
    if flagged:
        options.append("PIXELTYPE=SIGNEDBYTE")
    dataset = gdal.GetDriverByName("GTiff").Create(path, width, height, bands, TYPES[type_name][0],
                                                   options)
    for band in range(bands):
        target = dataset.GetRasterBand(band + 1)
        plane = np.ascontiguousarray(pixels[:, :, band])
        # While a file is still empty: later GDAL takes none.
        if colors is not None:
            table = gdal.ColorTable()
            for index, color in enumerate(colors):
                table.SetColorEntry(index, color)
            target.SetColorTable(table)
        target.WriteArray(plane.view(np.uint8) if flagged else plane)
        if nodata is not None:
            target.SetNoDataValue(nodata)
    dataset = None
    return path


def matches(value, shape):
    """Whether a JSON value has a shape: a dict of exactly these keys, a list of one shape, a type,
    or a tuple of alternatives."""
    if isinstance(shape, tuple):
        return any(matches(value, alternative) for alternative in shape)
    if isinstance(shape, dict):
        return (isinstance(value, dict) and list(value) == list(shape) and
                all(matches(value[key], shape[key]) for key in shape))
    if isinstance(shape, list):
        return isinstance(value, list) and all(matches(item, shape[0]) for item in value)
    if shape is None:
        return value is None
    if shape is int:
        return isinstance(value, int) and not isinstance(value, bool)
    return isinstance(value, shape)


REAL = (int, float, str)  # numbers that JSON does not carry exactly are strings
COUNT = (int, str)


class ToolTest(unittest.TestCase):
    """A test with a folder of its own as working folder of the program."""

    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="zmctools")
        self.addCleanup(shutil.rmtree, self.folder)

    def path(self, name):
        return os.path.join(self.folder, name)

    def files(self):
        return sorted(os.listdir(self.folder))

    def run_tool(self, *arguments, **more):
        return subprocess.run([TOOL, *map(str, arguments)], cwd=self.folder, capture_output=True,
                              text=True, timeout=300, stdin=subprocess.DEVNULL, **more)

    def good(self, *arguments, **more):
        """Runs the program, which must succeed without a message, and gives its output."""
        done = self.run_tool(*arguments, **more)
        self.assertEqual((done.returncode, done.stderr), (0, ""), done)
        return done.stdout

    def document(self, *arguments, status=0):
        done = self.run_tool(*arguments, "--json")
        self.assertEqual((done.returncode, done.stderr), (status, ""), done)
        document = json.loads(done.stdout)
        self.assertEqual(next(iter(document.items())), ("schema", 1))
        return document

    def refused(self, status, message, *arguments, **more):
        """Runs the program, which must fail with exactly this message and print nothing."""
        done = self.run_tool(*arguments, **more)
        self.assertEqual(done.stderr, f"zmcraster: {message}\n")
        self.assertEqual((done.returncode, done.stdout), (status, ""))

    def assertShape(self, value, shape):
        self.assertTrue(matches(value, shape), value)

    def picture(self, name="picture.tif", height=300, width=700, bands=3, seed=1):
        pixels = samples("Byte", height, width, bands, seed)
        geotiff(self.path(name), pixels)
        return pixels

    def pyramid(self, name="picture.pyr", *options):
        """A pyramid of a picture; both in the folder."""
        pixels = self.picture()
        self.good("build", "picture.tif", name, *options)
        return pixels
