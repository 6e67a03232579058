"""Pyramid files for xarray: ``xarray.open_dataset("scene.pyr", engine="zmcraster")``.

The dataset has one variable, ``band_data``, with the dimensions band, y and x; coordinates of the middles of the
pixels, and ``spatial_ref`` with the coordinate reference system and GeoTransform, as rioxarray names them. Pixels are
read when they are needed; with ``chunks={}`` a chunk of Dask's is a tile.

>>> import xarray
>>> scene = xarray.open_dataset("scene.pyr", engine="zmcraster", mask_and_scale=False, level=1)
>>> dict(scene.sizes), scene.band_data.dtype
({'band': 3, 'y': 300, 'x': 350}, dtype('uint8'))
>>> scene.x.values[:2].tolist(), scene.band_data.encoding["preferred_chunks"]
([500030.0, 500090.0], {'band': 3, 'y': 256, 'x': 256})
>>> scene.close()
"""
from __future__ import annotations

import os
from typing import Any, Iterable, Optional, Tuple, Union

import numpy as np
import xarray as xr
from xarray.backends import BackendArray, BackendEntrypoint
from xarray.core import indexing

from ._raster import Level, Raster, open

GRID_MAPPING = "spatial_ref"


class _Pixels(BackendArray):
    """All bands of a level."""

    def __init__(self, raster: Raster, level: Level):
        self.raster = raster
        self.level = level
        self.shape = (raster.bands, level.height, level.width)
        self.dtype = raster.dtype

    def __getitem__(self, key: indexing.ExplicitIndexer) -> np.ndarray:
        # xarray takes slices with a step backwards apart, and some versions lose pixels of them.
        if isinstance(key, indexing.BasicIndexer):
            return self._read(key.tuple)
        return indexing.explicit_indexing_adapter(key, self.shape, indexing.IndexingSupport.BASIC, self._read)

    def _read(self, key: Tuple[Union[int, slice], ...]) -> np.ndarray:
        ranges = [range(size)[part] if isinstance(part, slice) else range(size)[part:part + 1 or None]
                  for part, size in zip(key, self.shape)]
        if any(len(each) == 0 for each in ranges):
            pixels = np.empty([len(each) for each in ranges], self.dtype)
        else:
            bands, rows, columns = ranges
            begins = min(columns[0], columns[-1]), min(rows[0], rows[-1])
            ends = max(columns[0], columns[-1]) + 1, max(rows[0], rows[-1]) + 1
            window = (*begins, ends[0] - begins[0], ends[1] - begins[1])
            pixels = self.raster.read([band + 1 for band in bands], window=window, level=self.level.number)
            pixels = pixels[:, ::rows.step, ::columns.step]
        return pixels[tuple(slice(None) if isinstance(part, slice) else 0 for part in key)]


def _place(raster: Raster, level: Level) -> Tuple[float, ...]:
    """The transform of a level; by pixels of the finest one where the raster has none."""
    factor = float(raster._factor(level))
    return raster.transform_of(level.number) or (factor, 0.0, 0.0, 0.0, factor, 0.0)


def _coordinates(raster: Raster, level: Level) -> dict:
    """Of the middles of pixels: by column and by row, or of each pixel where the raster is turned."""
    a, b, c, d, e, f = _place(raster, level)
    columns, rows = np.arange(level.width) + 0.5, np.arange(level.height) + 0.5
    if b == 0 and d == 0:
        return {"x": ("x", a * columns + c), "y": ("y", e * rows + f)}
    x, y = np.meshgrid(columns, rows)
    return {"xc": (("y", "x"), a * x + b * y + c), "yc": (("y", "x"), d * x + e * y + f)}


def _reference(raster: Raster, level: Level) -> dict:
    """What rioxarray keeps of the coordinate reference system and of the place."""
    attributes: dict = {}
    if raster.crs is not None:
        wkt = raster.crs
        try:
            import pyproj

            attributes.update(pyproj.CRS.from_wkt(wkt).to_cf())
        except ImportError:
            pass
        try:
            from rasterio.crs import CRS

            wkt = CRS.from_wkt(wkt).to_wkt()
        except ImportError:
            pass
        attributes.update(crs_wkt=wkt, spatial_ref=wkt)
    a, b, c, d, e, f = _place(raster, level)
    attributes["GeoTransform"] = " ".join(str(float(number)) for number in (c, a, b, f, d, e))
    return attributes


def _same(values: Iterable[Any]) -> Any:
    """The value that all are; None where they differ."""
    first, *others = values
    return first if all(each == first or (each != each and first != first) for each in others) else None


def _attributes(raster: Raster) -> dict:
    attributes: dict = dict(raster.metadata)
    nodata, scale, offset = (_same(values) for values in (raster.nodatavals, raster.scales, raster.offsets))
    if nodata is not None:
        attributes["_FillValue"] = raster.dtype.type(nodata)
    if scale is not None and offset is not None and (scale != 1 or offset != 0):
        attributes.update(scale_factor=scale, add_offset=offset)
    for name, values in (("long_name", raster.descriptions), ("units", raster.units)):
        if any(values):
            attributes[name] = values[0] if len(values) == 1 else values
    return attributes


class PyramidBackend(BackendEntrypoint):
    """The engine "zmcraster"."""

    description = "Pyramid files of rasters, by levels and tiles"
    open_dataset_parameters = ("filename_or_obj", "drop_variables", "mask_and_scale", "level", "threads", "missing")

    def open_dataset(self, filename_or_obj: Any, *, drop_variables: Any = None, mask_and_scale: bool = True,
                     level: Optional[int] = None, threads: int = 1, missing: str = "fail") -> xr.Dataset:
        """Opens a level of a raster, the finest by default; the other options are those of zmcraster.open.

        With mask_and_scale samples without data are NaN, and scale and offset are applied where all bands have the
        same.
        """
        raster = open(filename_or_obj, threads=threads, missing=missing)
        try:
            shown = raster._level(level)
            together = raster.bands if raster.ordering != "Morton" else 1
            encoding = {"preferred_chunks": {"band": together, "y": raster.tile, "x": raster.tile},
                        "grid_mapping": GRID_MAPPING, "source": raster.name}
            variable = xr.Variable(("band", "y", "x"), indexing.LazilyIndexedArray(_Pixels(raster, shown)),
                                   _attributes(raster), encoding)
            coordinates = {"band": ("band", np.arange(1, raster.bands + 1)), **_coordinates(raster, shown),
                           GRID_MAPPING: ((), 0, _reference(raster, shown))}
            dataset = xr.decode_cf(xr.Dataset({"band_data": variable}, coordinates), mask_and_scale=mask_and_scale,
                                   decode_times=False, decode_coords=False, drop_variables=drop_variables)
        except BaseException:
            raster.close()
            raise
        dataset.set_close(raster.close)
        return dataset

    def guess_can_open(self, filename_or_obj: Any) -> bool:
        """Whether a name ends as those of pyramids do."""
        try:
            name = os.fspath(filename_or_obj)
        except TypeError:
            return False
        return isinstance(name, str) and name.lower().endswith(".pyr")
