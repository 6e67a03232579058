"""Rasters that are open."""
from __future__ import annotations

import operator
import os
import threading
from typing import IO, Any, Iterable, NamedTuple, Optional, Sequence, Tuple, Union

import numpy as np

from . import _zmcraster
from ._errors import ArgumentError, FileError, MissingFileError

Path = Union[str, "os.PathLike[str]"]
Bands = Union[None, int, Iterable[int]]
_MAX_STRIDE = 2**31 - 1  # bytes between two pixels
_MAX_PIXELS = 2**32 - 1  # along a side


class Level(NamedTuple):
    """A level of a raster: its number, 0 for the finest, and its size in pixels."""
    number: int
    width: int
    height: int


class Window(NamedTuple):
    """A rectangle of a level: left column, top row, width and height in pixels of that level."""
    x: int
    y: int
    width: int
    height: int


class Statistics(NamedTuple):
    """Of the valid samples of a band at the finest level; the deviation is that of the population."""
    minimum: float
    maximum: float
    mean: float
    standard_deviation: float


class Histogram(NamedTuple):
    """Counts of samples, and the edges of the bins, one more than there are bins.

    Those of integers lie half a unit beside the values where a bin has whole values.
    """
    counts: np.ndarray
    edges: np.ndarray


def plain_name(path: Path) -> str:
    """The name of a file as text that every system call takes."""
    name = os.fspath(path)
    if not isinstance(name, str):
        raise TypeError("names of rasters are text")
    if not name or "\0" in name:
        raise ArgumentError("the name of a raster is empty, or has a null character in it")
    try:
        name.encode("utf-8")
    except UnicodeEncodeError:
        raise ArgumentError("the name of a raster is no UTF-8") from None
    return name


def whole(number: Any, what: str) -> int:
    """An integer that may come as any kind of number without a fraction."""
    try:
        return operator.index(number)
    except TypeError:
        pass
    if isinstance(number, (float, np.floating)) and float(number).is_integer():
        return int(number)
    raise ArgumentError(f"{what} is a whole number, not {number!r}")


def _range_of(part: slice, size: int, what: str) -> Tuple[int, int]:
    if part.step not in (None, 1):
        raise ArgumentError(f"{what} of a window have no step")
    begin = 0 if part.start is None else whole(part.start, what)
    end = size if part.stop is None else whole(part.stop, what)
    return begin, end - begin


def window_of(window: Any, level: Level) -> Window:
    """A window in any of its forms."""
    if window is None:
        return Window(0, 0, level.width, level.height)
    if all(hasattr(window, name) for name in ("col_off", "row_off", "width", "height")):
        window = (window.col_off, window.row_off, window.width, window.height)
    try:
        parts = tuple(window)
    except TypeError:
        raise ArgumentError(f"{window!r} is no window") from None
    if len(parts) == 2 and all(isinstance(part, slice) for part in parts):
        y, height = _range_of(parts[0], level.height, "rows")
        x, width = _range_of(parts[1], level.width, "columns")
    elif len(parts) == 4:
        x, y, width, height = (whole(part, "a part of a window") for part in parts)
    else:
        raise ArgumentError("a window is (x, y, width, height) or a pair of slices, of rows and columns")
    if x < 0 or y < 0:
        raise ArgumentError("a window begins at 0 at the least")
    if width <= 0 or height <= 0:
        raise ArgumentError("the window is empty")
    if max(x, y, width, height) > _MAX_PIXELS:
        raise ArgumentError("the window reaches beyond the raster")
    return Window(x, y, width, height)


def exact(number: Any, dtype: np.dtype) -> Any:
    """A value of a band as it is stored: an integer of one of integers."""
    if number is None or dtype.kind not in "iu" or not float(number).is_integer():
        return number
    return int(number)


class Raster:
    """An open pyramid file, as `zmcraster.open` gives it.

    >>> raster = open("scene.pyr")
    >>> raster.width, raster.height, raster.bands, raster.dtype
    (700, 600, 3, dtype('uint8'))
    >>> raster.levels
    (Level(number=0, width=700, height=600), Level(number=1, width=350, height=300), Level(number=2, width=175, height=150))
    >>> raster.nodata, raster.transform
    (9, (30.0, 0.0, 500000.0, 0.0, -30.0, 4000000.0))
    >>> raster.close()

    Any number of threads may read one at once. It is closed by `close`, or behind a `with`.
    """

    def __init__(self, file: "_zmcraster.File", mode: str, reopen: Optional[Tuple[Any, ...]] = None):
        self._file = file
        self._mode = mode
        self._reopen = reopen
        self._told: Optional[dict] = None
        self._lock = threading.Lock()
        #: Name of the file, or what stands for a file object.
        self.name: str = file.name
        #: Size of the finest level in pixels.
        self.width: int = file.width
        self.height: int = file.height
        #: Number of bands.
        self.bands: int = file.bands
        #: Type of the samples, of all bands.
        self.dtype: np.dtype = file.dtype
        #: All levels, from the finest one on.
        self.levels: Tuple[Level, ...] = tuple(Level(*level) for level in file.levels)
        #: Order of the tiles in the file: "Scanline", "Blocked" or "Morton".
        self.ordering: str = file.ordering
        #: Side of the square tiles in pixels.
        self.tile: int = file.tile
        #: Whether the file has all of its pixels; of one that has not, those are read that are there.
        self.complete: bool = file.bytes_missing == 0
        self._shown = file.sample_dtype

    # --- what is told ---

    @property
    def mode(self) -> str:
        """"r", "r+" or "w"."""
        return self._mode

    @property
    def closed(self) -> bool:
        """Whether the raster was closed."""
        return self._file.closed

    @property
    def shape(self) -> Tuple[int, int, int]:
        """(bands, height, width), as `read` gives all of the finest level."""
        return self.bands, self.height, self.width

    def _facts(self) -> dict:
        with self._lock:
            if self._told is None:
                self._told = self._file.facts()
            return self._told

    @property
    def crs(self) -> Optional[str]:
        """The coordinate reference system as WKT, which pyproj, rasterio and GDAL read; None if there is none."""
        return self._facts()["crs"]

    @property
    def transform(self) -> Optional[Tuple[float, ...]]:
        """(a, b, c, d, e, f) of x = a column + b row + c and y = d column + e row + f, as affine.Affine takes them."""
        told = self._facts()["transform"]
        if told is None:
            return None
        c, a, b, f, d, e = told
        return a, b, c, d, e, f

    @property
    def nodata(self) -> Any:
        """The value of the first band that marks samples without data; None if there is none."""
        return self.nodatavals[0]

    @property
    def nodatavals(self) -> Tuple[Any, ...]:
        """The same of all bands."""
        return tuple(exact(value, self.dtype) for value in self._of_bands("nodata"))

    @property
    def descriptions(self) -> Tuple[str, ...]:
        """Descriptions of the bands, empty where there are none."""
        return self._of_bands("description")

    @property
    def units(self) -> Tuple[str, ...]:
        """Units of the bands' values, empty where there are none."""
        return self._of_bands("unit")

    @property
    def scales(self) -> Tuple[float, ...]:
        """By band, with which samples are multiplied to get values."""
        return self._of_bands("scale")

    @property
    def offsets(self) -> Tuple[float, ...]:
        """By band, what is added to scaled samples to get values."""
        return self._of_bands("offset")

    @property
    def interpretations(self) -> Tuple[str, ...]:
        """What the bands stand for: "Gray", "Red", "Alpha", "Palette" ..."""
        return self._of_bands("interpretation")

    @property
    def metadata(self) -> dict:
        """Further items that are kept with the raster, as texts."""
        return dict(self._facts()["metadata"])

    def band_metadata(self, band: int = 1) -> dict:
        """Further items that are kept with a band, as texts."""
        return dict(self._facts()["bands"][self._band(band) - 1]["metadata"])

    def transform_of(self, level: int) -> Optional[Tuple[float, ...]]:
        """The transform of a level, whose pixels are 2, 4, 8 ... times as large.

        >>> with open("scene.pyr") as raster:
        ...     raster.transform_of(1)
        (60.0, 0.0, 500000.0, 0.0, -60.0, 4000000.0)
        """
        told = self.transform
        factor = self._factor(self._level(level))
        if told is None:
            return None
        a, b, c, d, e, f = told
        return a * factor, b * factor, c, d * factor, e * factor, f

    def statistics(self, band: int = 1) -> Optional[Statistics]:
        """What the file keeps of a band; None if that is nothing.

        >>> with open("scene.pyr") as raster:
        ...     raster.statistics(1).minimum, raster.statistics(1).maximum
        (0.0, 255.0)
        """
        told = self._file.statistics(self._band(band))
        return None if told is None else Statistics(*told)

    def histogram(self, band: int = 1) -> Optional[Histogram]:
        """What the file keeps of a band; None if that is nothing.

        >>> with open("scene.pyr") as raster:
        ...     counts, edges = raster.histogram(1)
        >>> len(counts), len(edges)
        (256, 257)
        """
        told = self._file.histogram(self._band(band))
        if told is None:
            return None
        counts, lower, upper = told
        return Histogram(counts, np.linspace(lower, upper, len(counts) + 1))

    def palette(self, band: int = 1) -> Optional[np.ndarray]:
        """The colours of a band: red, green, blue and alpha of each, uint8; None if it has no palette."""
        return self._file.palette(self._band(band))

    # --- pixels ---

    def read(self, bands: Bands = None, window: Any = None, level: Optional[int] = None, masked: bool = False,
             out: Optional[np.ndarray] = None) -> np.ndarray:
        """Reads a window of a level.

        bands   one band, for an array of two dimensions, or several in any order; all by default
        window  (x, y, width, height), a pair of slices (rows, columns), or a window of rasterio's; all by default
        level   its number; the finest by default
        masked  as a masked array, in which samples without data, or hidden by alpha or a mask, are masked
        out     an array of the shape and type of the result, which is filled and returned

        >>> with open("scene.pyr") as raster:
        ...     part = raster.read([3, 1], window=(10, 20, 300, 200))
        ...     same = raster.read(3, window=(slice(20, 220), slice(10, 310)), masked=True)
        >>> part.shape, same.shape, type(same).__name__
        ((2, 200, 300), (200, 300), 'MaskedArray')
        """
        shown = self._level(level)
        numbers, single = self._bands(bands)
        place = window_of(window, shown)
        area = _zmcraster.Area(*place)
        pixels = self._read(shown, place, numbers, single, out)
        if not masked:
            return pixels
        valid = self._file.valid(shown.number, area, numbers)
        mask = np.ma.nomask if valid is None else (valid == 0)
        if single and valid is not None:
            mask = mask[0]
        nodata = self.nodatavals[numbers[0] - 1]
        return np.ma.MaskedArray(pixels, mask=mask, fill_value=nodata, copy=False)

    def write(self, array: Any, bands: Bands = None, window: Any = None) -> None:
        """Writes a window of the finest level; the raster is open with mode "r+", or was made by `create`.

        An array of two dimensions is one band. Masked samples become the no-data value. The coarser levels,
        statistics and histograms are made anew when the raster is closed.
        """
        shown = self.levels[0]
        numbers, single = self._bands(bands)
        place = window_of(window, shown)
        samples = self._samples(array, numbers)
        if samples.ndim == 2 and (single or len(numbers) == 1):
            samples = samples[np.newaxis]
        if samples.shape != (len(numbers), place.height, place.width):
            raise ArgumentError(f"the array has the shape {samples.shape}, and the window "
                                f"{(len(numbers), place.height, place.width)}")
        if self._shown != self.dtype:
            samples = self._as_shown(samples)
        self._file.write(_zmcraster.Area(*place), numbers, samples)

    def close(self) -> None:
        """Brings to the disk what was written, and closes. Closing again does nothing."""
        self._close(True)

    def _close(self, keep: bool) -> None:
        self._file.close(keep)

    def __enter__(self) -> "Raster":
        return self

    def __exit__(self, kind: Any, *_: Any) -> None:
        self._close(kind is None or self._mode != "w")

    def __repr__(self) -> str:
        state = "closed " if self.closed else ""
        return (f"<{state}zmcraster.Raster {self.name!r} mode={self._mode!r}: {self.width} x {self.height}, "
                f"{self.bands} band{'' if self.bands == 1 else 's'} of {self.dtype}>")

    def __reduce__(self) -> Any:
        if self._reopen is None:
            raise TypeError("a raster that is read from a file object or is open for writing cannot be pickled")
        return _open_again, self._reopen

    # --- what arguments mean ---

    def _level(self, level: Optional[int]) -> Level:
        if level is None:
            return self.levels[0]
        number = whole(level, "a level")
        for each in self.levels:
            if each.number == number:
                return each
        raise ArgumentError(f"there is no level {number}: {self.name} has levels {self.levels[0].number} to "
                            f"{self.levels[-1].number}")

    def _factor(self, level: Level) -> float:
        """How many pixels of the finest level stand beside each other in one."""
        return 2.0 ** (level.number - self.levels[0].number)

    def _of_bands(self, what: str) -> Tuple[Any, ...]:
        return tuple(band[what] for band in self._facts()["bands"])

    def _band(self, band: Any) -> int:
        number = whole(band, "a band")
        if not 1 <= number <= self.bands:
            raise ArgumentError(f"there is no band {number}: {self.name} has bands 1 to {self.bands}")
        return number

    def _bands(self, bands: Bands) -> Tuple[Sequence[int], bool]:
        if bands is None:
            return list(range(1, self.bands + 1)), False
        if isinstance(bands, Iterable) and not isinstance(bands, (str, bytes)):
            numbers = [self._band(band) for band in bands]
            if not numbers:
                raise ArgumentError("no band is asked for")
            return numbers, False
        return [self._band(bands)], True

    def _read(self, level: Level, place: Window, numbers: Sequence[int], single: bool,
              out: Optional[np.ndarray]) -> np.ndarray:
        area = _zmcraster.Area(*place)
        if out is None:
            pixels = self._file.read(level.number, area, numbers)
            if self._shown != self.dtype:
                pixels = self._from_shown(pixels)
            return pixels[0] if single else pixels
        if not isinstance(out, np.ndarray):
            raise ArgumentError("out is no array of NumPy's")
        if out.dtype != self.dtype or not out.dtype.isnative:
            raise ArgumentError(f"out has the type {out.dtype.str}, and the raster {self.dtype.str}")
        if not out.flags.writeable:
            raise ArgumentError("out cannot be written to")
        planes = out[np.newaxis] if single and out.ndim == 2 else out
        wanted = (len(numbers), place.height, place.width)
        if planes.shape != wanted:
            raise ArgumentError(f"out has the shape {out.shape}, and the window {wanted[single:]}")
        if (out.flags.aligned and self._shown == self.dtype and type(out) is np.ndarray and
                abs(planes.strides[2]) <= _MAX_STRIDE):
            self._file.read(level.number, area, numbers, planes)
            return out
        pixels = self._file.read(level.number, area, numbers)
        np.copyto(np.asarray(planes), self._from_shown(pixels))
        return out

    def _as_shown(self, samples: np.ndarray) -> np.ndarray:
        """Signed bytes as the type that GDAL has for them."""
        if self._shown.itemsize == self.dtype.itemsize:
            return samples.view(self._shown)
        return samples.astype(self._shown)

    def _from_shown(self, samples: np.ndarray) -> np.ndarray:
        if self._shown.itemsize == self.dtype.itemsize:
            return samples.view(self.dtype)
        return samples.astype(self.dtype)

    def _samples(self, array: Any, numbers: Sequence[int]) -> np.ndarray:
        if np.ma.isMaskedArray(array):
            value = self.nodatavals[numbers[0] - 1]
            if value is None and np.ma.is_masked(array):
                raise ArgumentError("masked samples cannot be written: the raster has no no-data value")
            array = array.filled(0 if value is None else value)
        samples = np.asarray(array)
        if samples.dtype != self.dtype:
            raise ArgumentError(f"the array has the type {samples.dtype}, and the raster {self.dtype}")
        if not samples.flags.aligned or any(stride <= 0 for stride in samples.strides):
            samples = samples.copy()
        return samples


def _open_again(name: str, threads: int, missing: str) -> Raster:
    return open(name, threads=threads, missing=missing)


def open(source: Union[Path, IO[bytes]], mode: str = "r", *, threads: int = 1, missing: str = "fail",
         refresh: bool = True, resampling: Optional[str] = None) -> Raster:
    """Opens a pyramid file.

    source      a path, a URL (http, https), a name of GDAL's virtual file systems, or a file object that can be
                read at any place; such an object belongs to the raster as long as that is open
    mode        "r" to read, "r+" to write windows too, of plain files
    threads     that read one large window together
    missing     what reading pixels does that an incomplete file does not have: "fail", or "zeros"
    refresh     whether closing makes the levels, statistics and histograms of what was written anew
    resampling  how these levels are reduced; average by default, and mode of a raster with a palette

    >>> import io
    >>> with io.open("scene.pyr", "rb") as file, open(file) as raster:
    ...     raster.read(1, window=(0, 0, 2, 2)).shape
    (2, 2)
    >>> open("nothing.pyr")
    Traceback (most recent call last):
        ...
    zmcraster.MissingFileError: nothing.pyr: cannot open the raster: there is no such file
    """
    if mode not in ("r", "r+"):
        raise ArgumentError(f'mode is "r" or "r+", not {mode!r}; zmcraster.create makes new rasters')
    if missing not in ("fail", "zeros"):
        raise ArgumentError(f'missing is "fail" or "zeros", not {missing!r}')
    count = whole(threads, "a number of threads")
    if not 1 <= count <= 1024:
        raise ArgumentError("there are 1 to 1024 threads")
    zeros = missing == "zeros"
    if hasattr(source, "read") and hasattr(source, "seek"):
        if mode != "r":
            raise ArgumentError("a raster that is read from a file object cannot be written to")
        return Raster(_zmcraster.open_object(source, _name_of(source), count, zeros), mode)
    name = plain_name(source)  # type: ignore[arg-type]
    if mode == "r+" and _zmcraster.is_virtual(name):
        raise ArgumentError("rasters are written to in plain files alone")
    try:
        file = _zmcraster.open(name, mode == "r+", bool(refresh), resampling or "", count, zeros)
    except FileError as error:
        if _zmcraster.is_virtual(name) or os.path.lexists(name):
            raise
        raise MissingFileError(str(error)) from None
    return Raster(file, mode, (name, count, missing) if mode == "r" else None)


def _name_of(source: Any) -> str:
    name = getattr(source, "name", None)
    return name if isinstance(name, str) and name else f"<{type(source).__name__}>"
