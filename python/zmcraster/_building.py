"""Rasters that are made: built of arrays and other rasters, or written window by window."""
from __future__ import annotations

import os
import sys
from typing import Any, Callable, List, Mapping, NamedTuple, Optional, Sequence, Tuple, Union

import numpy as np

from . import _zmcraster
from ._errors import ArgumentError, FileError
from ._raster import Path, Raster, exact, plain_name, whole

Progress = Callable[[int, int], Any]


class BuildReport(NamedTuple):
    """What a build has made."""
    path: str
    width: int
    height: int
    bands: int
    max_level: int
    resampling: str
    file_size: int
    seconds: float


class _Facts(NamedTuple):
    """What is told of a raster that is made."""
    crs: Any = None
    transform: Any = None
    nodata: Any = None
    descriptions: Sequence[Optional[str]] = ()
    alpha: Optional[int] = None
    metadata: Mapping[str, str] = {}
    palette: Any = None

    def for_type(self, dtype: np.dtype) -> "_zmcraster.Facts":
        return _zmcraster.Facts(_crs_text(self.crs), _transform(self.transform), _nodata(self.nodata, dtype),
                                [text or "" for text in self.descriptions],
                                None if self.alpha is None else whole(self.alpha, "a band"),
                                {str(name): str(value) for name, value in self.metadata.items()})


def _crs_text(crs: Any) -> str:
    if crs is None:
        return ""
    if isinstance(crs, (int, np.integer)):
        return f"EPSG:{int(crs)}"
    if hasattr(crs, "to_wkt"):
        return crs.to_wkt()
    if isinstance(crs, str):
        return crs
    raise ArgumentError("crs is WKT, a name such as EPSG:4326, or an object of pyproj or rasterio")


def _transform(transform: Any) -> Optional[Tuple[float, ...]]:
    """As GDAL orders its six numbers."""
    if transform is None:
        return None
    try:
        a, b, c, d, e, f = (float(number) for number in tuple(transform)[:6])
    except (TypeError, ValueError):
        raise ArgumentError("transform has the six numbers a, b, c, d, e, f") from None
    return c, a, b, f, d, e


def _nodata(value: Any, dtype: np.dtype) -> Any:
    """As the extension takes it: in the form that holds all values of the type."""
    if value is None:
        return None
    try:
        if dtype.kind in "iu":
            number = whole(value, "nodata")
            if not np.iinfo(dtype).min <= number <= np.iinfo(dtype).max:
                raise ArgumentError(f"no sample of type {dtype} can have the no-data value {value}")
            return number
        return float(value)
    except (TypeError, OverflowError):
        raise ArgumentError(f"nodata is a number, not {value!r}") from None


# --- sources of pixels ---

class _Array:
    """An array of NumPy's, or what NumPy takes for one."""

    def __init__(self, array: Any, nodata: Any):
        planes = array if array.ndim == 3 else array[np.newaxis]
        self.nodata = nodata
        self._fill: Any = None
        if np.ma.isMaskedArray(planes):
            if nodata is None and np.ma.is_masked(planes):
                self.nodata = exact(planes.fill_value.item(), planes.dtype)
                if planes.dtype.kind in "iu" and not (
                        np.iinfo(planes.dtype).min <= self.nodata <= np.iinfo(planes.dtype).max):
                    raise ArgumentError(f"masked samples need a no-data value: no sample can be {self.nodata}")
            self._fill = 0 if self.nodata is None else self.nodata
        self.planes = planes
        self.bands, self.height, self.width = planes.shape
        self.dtype = planes.dtype.newbyteorder("=")
        self.name = "array"

    def read(self, x: int, y: int, width: int, height: int, bands: List[int]) -> np.ndarray:
        in_order = bands == list(range(bands[0], bands[0] + len(bands)))
        which = slice(bands[0] - 1, bands[0] - 1 + len(bands)) if in_order else [band - 1 for band in bands]
        part = self.planes[which, y:y + height, x:x + width]
        if self._fill is not None:
            part = part.filled(self._fill)
        return part.astype(self.dtype, copy=False)


class _Dask(_Array):
    """An array of Dask's: rows of chunks are computed once each, and held while they are passed."""

    def __init__(self, array: Any, nodata: Any):
        if any(size != size for side in array.chunks for size in side):
            raise ArgumentError("the chunks of the array have no known sizes")
        super().__init__(array, nodata)
        self.name = "Dask array"
        self._ends = np.cumsum(self.planes.chunks[1])
        self._held: dict = {}
        self._columns: Optional[Tuple[int, int]] = None

    def _rows(self, number: int, x: int, width: int) -> np.ndarray:
        if number not in self._held:
            begin = int(self._ends[number - 1]) if number else 0
            part = self.planes[:, begin:int(self._ends[number]), x:x + width]
            computed = part.compute()
            if np.ma.isMaskedArray(computed):
                if self.nodata is None and np.ma.is_masked(computed):
                    raise ArgumentError("masked samples need a no-data value: nodata=")
                computed = computed.filled(0 if self.nodata is None else self.nodata)
            self._held[number] = begin, np.asarray(computed)
        return self._held[number]

    def read(self, x: int, y: int, width: int, height: int, bands: List[int]) -> np.ndarray:
        if self._columns != (x, width):
            self._held, self._columns = {}, (x, width)
        first = int(np.searchsorted(self._ends, y, side="right"))
        last = int(np.searchsorted(self._ends, y + height - 1, side="right"))
        for number in [each for each in self._held if each < first]:
            del self._held[number]
        which = [band - 1 for band in bands]
        parts = []
        for number in range(first, last + 1):
            begin, rows = self._rows(number, x, width)
            parts.append(rows[which, max(y - begin, 0):y + height - begin])
        whole_part = parts[0] if len(parts) == 1 else np.concatenate(parts, axis=1)
        return whole_part.astype(self.dtype, copy=False)


class _Dataset:
    """A dataset of rasterio's that is not to be had by its name, such as one that warps."""

    def __init__(self, dataset: Any, nodata: Any):
        types = {np.dtype(each) for each in dataset.dtypes}
        self.dtype = np.result_type(*types)
        self.dataset = dataset
        self.bands, self.height, self.width = dataset.count, dataset.height, dataset.width
        self.nodata = dataset.nodata if nodata is None else nodata
        self.name = str(dataset.name)

    def facts(self) -> _Facts:
        names = [interpretation.name for interpretation in self.dataset.colorinterp]
        return _Facts(self.dataset.crs, None if self.dataset.transform.is_identity else self.dataset.transform,
                      self.nodata, self.dataset.descriptions,
                      names.index("alpha") + 1 if "alpha" in names else None, self.dataset.tags(), self._palette())

    def _palette(self) -> Optional[np.ndarray]:
        try:
            colors = self.dataset.colormap(1)
        except ValueError:
            return None
        return np.array([colors[index] for index in sorted(colors)], np.uint8)

    def read(self, x: int, y: int, width: int, height: int, bands: List[int]) -> np.ndarray:
        part = self.dataset.read(bands, window=((y, y + height), (x, x + width)))
        return part.astype(self.dtype, copy=False)


def _named(source: Any) -> "Optional[_zmcraster.Source]":
    """A dataset of rasterio's by its name, with all that GDAL knows of it; None where that is another raster."""
    import rasterio.io
    import rasterio.vrt

    if not isinstance(source, rasterio.io.DatasetReader) or isinstance(source, rasterio.vrt.WarpedVRT):
        return None
    if source.mode != "r":
        return None
    try:
        named = _zmcraster.Source(plain_name(source.name))
    except (FileError, ArgumentError):
        return None
    width, height, bands, _ = named.shape
    return named if (width, height, bands) == (source.width, source.height, source.count) else None


def _is_rasterio(source: Any) -> bool:
    module = sys.modules.get("rasterio.io")
    return module is not None and isinstance(source, module.DatasetReader) or type(source).__name__ == "WarpedVRT"


def _array_source(source: Any, nodata: Any) -> _Array:
    if hasattr(source, "dask") and hasattr(source, "chunks"):
        kind, array = _Dask, source
    else:
        kind, array = _Array, source if isinstance(source, np.ndarray) else np.asarray(source)
    if array.ndim not in (2, 3) or 0 in array.shape:
        raise ArgumentError(f"an array of shape {tuple(array.shape)} is no raster: its shape is (bands, rows, "
                            "columns) or (rows, columns)")
    return kind(array, nodata)


# --- builds ---

def _words(target: str, bands: Optional[Sequence[int]], **words: Any) -> "_zmcraster.BuildWords":
    made = _zmcraster.BuildWords(target)
    levels = words["levels"]
    if levels not in (None, "auto"):
        made.levels = _bounded(levels, "levels", 0, 31)
    made.resampling = words["resampling"] or ""
    if words["weights"] not in ("auto", "none"):
        raise ArgumentError(f"weights are auto or none, not {words['weights']!r}")
    made.weights = words["weights"] == "auto"
    made.ordering = str(words["ordering"])
    made.bands = [] if bands is None else [_bounded(band, "a band", 1, 65536) for band in bands]
    if bands is not None and not made.bands:
        raise ArgumentError("no band is asked for")
    made.bins = _bounded(words["bins"], "bins", 1, 1 << 24)
    made.memory = str(words["memory"])
    made.threads = _bounded(words["threads"], "threads", 0, 1024)
    made.no_statistics = bool(words["no_statistics"])
    made.overwrite = bool(words["overwrite"])
    made.embed = bool(words["embed"])
    return made


def _bounded(value: Any, what: str, least: int, most: int) -> int:
    number = whole(value, what)
    if not least <= number <= most:
        raise ArgumentError(f"{what}: {number} is not between {least} and {most}")
    return number


def build(source: Any, target: Path, *, levels: Union[None, int, str] = "auto", resampling: Optional[str] = None,
          weights: str = "auto", ordering: str = "auto", nodata: Any = None, bands: Optional[Sequence[int]] = None,
          bins: int = 256, no_statistics: bool = False, memory: Union[int, str] = "256M", embed: bool = False,
          overwrite: bool = False, threads: int = 0, progress: Optional[Progress] = None, crs: Any = None,
          transform: Any = None, descriptions: Sequence[Optional[str]] = (), alpha: Optional[int] = None,
          palette: Any = None, metadata: Optional[Mapping[str, str]] = None) -> BuildReport:
    """Makes a pyramid file of a raster: all levels, statistics and histograms, in one pass.

    source     an array of NumPy's or Dask's of shape (bands, rows, columns) or (rows, columns), a dataset of
               rasterio's, or the name of any raster that GDAL reads
    target     the file; it appears when it is finished, and never half done
    progress   called now and then with the pixels that are done and those of all the build, on another thread;
               where it answers False the build ends with Cancelled, and what it raises is raised

    The options are those of ``zmcraster build``: levels, resampling, weights, ordering, nodata (a number, or
    "none"), bands (from 1, in the order wanted), bins, no_statistics, memory, embed, overwrite and threads (0: all
    processors).

    Arrays are told what they stand for: crs (WKT, "EPSG:32633", a number of EPSG's, or an object of pyproj or
    rasterio), transform (six numbers, or an affine.Affine), descriptions of the bands, which band is alpha, a
    palette of the first band (red, green, blue and alpha of each colour) and further metadata. The no-data value of
    a masked array is its fill value, if none is given.

    >>> import numpy as np
    >>> heights = np.arange(600 * 500, dtype=np.float32).reshape(600, 500)
    >>> report = build(heights, "heights.pyr", crs="EPSG:32633", transform=(10, 0, 4e5, 0, -10, 5e6))
    >>> report.max_level, report.resampling
    (2, 'average')
    """
    name = plain_name(target)
    options = dict(levels=levels, resampling=resampling, weights=weights, ordering=ordering, bins=bins,
                   no_statistics=no_statistics, memory=memory, embed=embed, overwrite=overwrite, threads=threads)
    words = _words(name, bands, **options)
    told = _Facts(crs, transform, None if nodata == "none" else nodata, descriptions, alpha, metadata or {}, palette)
    words.nodata = "" if nodata is None else _number_text(nodata)
    if not overwrite and os.path.lexists(name):
        raise FileError(f"{name}: cannot build it: the file exists already; overwrite=True replaces it")
    named = None
    if isinstance(source, (str, os.PathLike)):
        named = _zmcraster.Source(plain_name(source))
    elif _is_rasterio(source):
        named = _named(source)
    if named is not None:
        if descriptions or metadata or any(each is not None for each in (crs, transform, alpha, palette)):
            raise ArgumentError("what the bands stand for is told of arrays alone")
        return BuildReport(name, **named.build(words, progress))
    if _is_rasterio(source):
        pixels = _Dataset(source, told.nodata)
        told = pixels.facts()
    else:
        pixels = _array_source(source, told.nodata)
        told = told._replace(nodata=pixels.nodata)
    if nodata == "none":
        told = told._replace(nodata=None)
    facts = told.for_type(pixels.dtype)
    shape = _zmcraster.Shape(pixels.name, pixels.width, pixels.height, pixels.bands, pixels.dtype, facts,
                             told.palette)
    return BuildReport(name, **_zmcraster.build(shape, pixels.read, facts, words, progress))


def _number_text(nodata: Any) -> str:
    if nodata == "none":
        return "none"
    try:
        return str(int(nodata)) if float(nodata).is_integer() else repr(float(nodata))
    except (TypeError, ValueError):
        raise ArgumentError(f'nodata is a number or "none", not {nodata!r}') from None


def create(path: Path, width: int, height: int, bands: int = 1, dtype: Any = np.uint8, *,
           levels: Union[None, int, str] = "auto", resampling: Optional[str] = None, weights: str = "auto",
           ordering: str = "auto", nodata: Any = None, bins: int = 256, no_statistics: bool = False,
           memory: Union[int, str] = "256M", embed: bool = False, overwrite: bool = False, threads: int = 0,
           crs: Any = None, transform: Any = None, descriptions: Sequence[Optional[str]] = (),
           alpha: Optional[int] = None, metadata: Optional[Mapping[str, str]] = None) -> Raster:
    """A new raster that is written window by window, in any order.

    Windows of all bands that cover whole tiles of 256 pixels go straight to their places. The file appears when
    the raster is closed, and has levels, statistics and histograms then; where the block of a ``with`` raises, it
    does not appear. What is never written is the no-data value, or 0. Options are those of `build`.

    >>> import numpy as np
    >>> with create("mosaic.pyr", 512, 512, bands=1, dtype="int16", nodata=-1) as raster:
    ...     raster.write(np.full((256, 256), 7, np.int16), window=(256, 256, 256, 256))
    >>> from zmcraster import open
    >>> with open("mosaic.pyr") as raster:
    ...     raster.read(1, window=(255, 256, 2, 1)).tolist()
    [[-1, 7]]
    """
    name = plain_name(path)
    words = _words(name, None, levels=levels, resampling=resampling, weights=weights, ordering=ordering, bins=bins,
                   no_statistics=no_statistics, memory=memory, embed=embed, overwrite=overwrite, threads=threads)
    try:
        kind = np.dtype(dtype)
    except TypeError:
        raise ArgumentError(f"{dtype!r} is no type of samples") from None
    if os.path.lexists(name) and not overwrite:
        raise FileError(f"{name}: cannot create it: the file exists already; overwrite=True replaces it")
    options = [f"LEVELS={'AUTO' if words.levels is None else words.levels}", f"ORDERING={words.ordering}",
               f"WEIGHTS={'AUTO' if words.weights else 'NONE'}", f"BINS={words.bins}", f"MEMORY={words.memory}",
               f"STATISTICS={'NO' if words.no_statistics else 'YES'}", f"EMBED={'YES' if words.embed else 'NO'}",
               f"NUM_THREADS={words.threads or 'ALL_CPUS'}"]
    if words.resampling:
        options.append(f"RESAMPLING={words.resampling}")
    told = _Facts(crs, transform, nodata, descriptions, alpha, metadata or {})
    made = _zmcraster.create(name, *(_bounded(size, "a size", 1, 2**31 - 1) for size in (width, height, bands)), kind,
                             options, told.for_type(kind))
    return Raster(made, "w")
