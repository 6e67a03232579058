"""What goes wrong, as exceptions with one clear line."""


class Error(Exception):
    """What every failure of this package is. It is an OSError or a ValueError as well."""


class FileError(Error, OSError):
    """A file could not be read, written or made."""


class MissingFileError(FileError, FileNotFoundError):
    """There is no file of that name."""


class Cancelled(Error):
    """A build was ended by its progress function; nothing was left behind."""


class ArgumentError(Error, ValueError):
    """An argument that fits no raster, or not this one."""


class RasterWarning(UserWarning):
    """What is worth knowing of a raster and does not keep it from being used."""


for _each in (Error, FileError, MissingFileError, Cancelled, ArgumentError, RasterWarning):
    _each.__module__ = "zmcraster"
del _each
