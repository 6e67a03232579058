"""Pyramid files of rasters: open, read, write and build them.

>>> import zmcraster
>>> with zmcraster.open("scene.pyr") as raster:
...     tile = raster.read(window=(256, 0, 256, 256))
...     coarse = raster.read(1, level=2)
>>> tile.shape, tile.dtype, coarse.shape
((3, 256, 256), dtype('uint8'), (150, 175))

Bands count from 1 and levels from 0, the finest, as on the command line. Arrays are those of NumPy, with the
shape (bands, rows, columns). A raster may be used by many threads at once; reading gives up Python's lock.

With xarray installed, ``xarray.open_dataset("scene.pyr", engine="zmcraster")`` opens pyramid files too.
"""
from ._building import BuildReport, build, create
from ._errors import ArgumentError, Cancelled, Error, FileError, MissingFileError, RasterWarning
from ._raster import Histogram, Level, Raster, Statistics, Window, open
from ._zmcraster import version as __version__

__all__ = ["ArgumentError", "BuildReport", "Cancelled", "Error", "FileError", "Histogram", "Level",
           "MissingFileError", "Raster", "RasterWarning", "Statistics", "Window", "__version__", "build", "create",
           "open"]
