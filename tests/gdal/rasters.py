"""Rasters for the tests of the driver, and what the tests share."""
import contextlib
import os
import resource
import shutil
import tempfile
import unittest

import numpy as np
from osgeo import gdal, osr

gdal.UseExceptions()
DRIVER = "ZMCPyramid"

TYPES = {
    gdal.GDT_Byte: np.uint8, gdal.GDT_UInt16: np.uint16, gdal.GDT_Int16: np.int16,
    gdal.GDT_UInt32: np.uint32, gdal.GDT_Int32: np.int32, gdal.GDT_UInt64: np.uint64,
    gdal.GDT_Int64: np.int64, gdal.GDT_Float32: np.float32, gdal.GDT_Float64: np.float64,
    gdal.GDT_CFloat32: np.complex64, gdal.GDT_CFloat64: np.complex128,
}
# How the driver shows signed bytes: GDAL has a type for them from 3.7 on.
SIGNED_BYTE = getattr(gdal, "GDT_Int8", gdal.GDT_Int16)
if hasattr(gdal, "GDT_Int8"):
    TYPES[gdal.GDT_Int8] = np.int8
COMPLEX = (gdal.GDT_CFloat32, gdal.GDT_CFloat64)


def samples(data_type, height, width, bands, seed=1):
    """Random samples over the whole range of a type, bands first."""
    kind = TYPES[data_type]
    random = np.random.default_rng(seed)
    shape = (bands, height, width)
    if data_type in COMPLEX:
        return (random.normal(0, 1e3, shape) + 1j * random.normal(0, 1e3, shape)).astype(kind)
    if np.issubdtype(kind, np.floating):
        return random.normal(0, 1e6, shape).astype(kind)
    limits = np.iinfo(kind)
    return random.integers(limits.min, limits.max, shape, dtype=kind, endpoint=True)


def memory_dataset(array, data_type, options=()):
    bands, height, width = array.shape
    dataset = gdal.GetDriverByName("MEM").Create("", width, height, bands, data_type, list(options))
    for number in range(bands):
        dataset.GetRasterBand(number + 1).WriteArray(array[number])
    return dataset


def place(dataset):
    """Gives a dataset a georeference."""
    reference = osr.SpatialReference()
    reference.ImportFromEPSG(32631)
    dataset.SetSpatialRef(reference)
    dataset.SetGeoTransform([500000, 30, 0, 4000000, 0, -30])


def halve(array):
    """The average of each 2 x 2 cell, rounded half away from zero, of 8-bit samples."""
    height, width = array.shape[-2] // 2 * 2, array.shape[-1] // 2 * 2
    cut = array[..., :height, :width].astype(np.uint32)
    total = cut[..., ::2, ::2] + cut[..., ::2, 1::2] + cut[..., 1::2, ::2] + cut[..., 1::2, 1::2]
    return ((total + 2) // 4).astype(np.uint8)


@contextlib.contextmanager
def file_sizes_up_to(size):
    """A limit of this process, which ignores the signal that comes with it, as Python does."""
    before = resource.getrlimit(resource.RLIMIT_FSIZE)
    resource.setrlimit(resource.RLIMIT_FSIZE, (size, before[1]))
    try:
        yield
    finally:
        resource.setrlimit(resource.RLIMIT_FSIZE, before)


class FolderTest(unittest.TestCase):
    """A test with a folder of its own, and nothing left open in it."""

    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="zmcgdal")
        self.addCleanup(shutil.rmtree, self.folder)

    def path(self, name):
        return os.path.join(self.folder, name)

    def files(self):
        return sorted(os.listdir(self.folder))

    def copy(self, dataset, name="raster.pyr", options=(), **more):
        """Makes a pyramid of a dataset and gives its path."""
        target = self.path(name)
        made = gdal.GetDriverByName(DRIVER).CreateCopy(target, dataset, options=list(options),
                                                       **more)
        self.assertIsNotNone(made)
        del made
        return target

    def descriptors(self):
        """Open files of this process in the folder."""
        opened = []
        for entry in os.listdir("/proc/self/fd"):
            try:
                name = os.readlink("/proc/self/fd/" + entry)
            except OSError:
                continue
            if name.startswith(self.folder):
                opened.append(name)
        return opened
