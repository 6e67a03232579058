#!/usr/bin/python3
"""Reads pyramid files with NumPy alone, after docs/format.md. Bands and levels count from 0."""
import argparse
import os
import struct
from functools import cached_property
from math import prod

import numpy as np
from pyramid_documents import MOST_TEXT, Records, decimal, parse, texts

TYPES = dict(Byte="u1", Char="i1", UInt16="<u2", USHORT="<u2", Int16="<i2", UInt32="<u4", Int32="<i4",
             UInt64="<u8", Int64="<i8", Single="<f4", Double="<f8", ComplexSingle="<c8", ComplexDouble="<c16")
MOST_BYTES, MOST_TILES = 1 << 30, 1 << 20  # of a window; of all bands or levels in Morton order


class Pyramid:
    def __init__(self, path):
        if not os.path.isfile(path):
            raise ValueError("there is no such file")
        self.path, self.file_size = path, os.path.getsize(path)
        magic, self.start = struct.unpack("<4sQ", self.bytes(0, 12))
        if magic != b"KOBT" or not 20 <= self.start <= min(self.file_size, MOST_TEXT):
            raise ValueError("it is no pyramid file")
        fields = dict(texts(parse(self.bytes(20, self.start - 20))))
        names = "VERSION_MAJOR VERSION_MINOR PIXEL_WIDTH PIXEL_HEIGHT BANDS TILESIZE LEVELMIN LEVELMAX"
        *version, self.width, self.height, self.bands, self.tile, first, last = (
            decimal(fields.get("HEADER_" + name, "")) for name in names.split())
        self.type, self.ordering = (  # a word ends at white space
            [*fields.get("HEADER_" + name, "").split(), ""][0] for name in ("PIXEL_TYPE", "BUILD_METHOD"))
        self.dtype = np.dtype(TYPES[self.type]) if self.type in TYPES else None
        self.sample, self.levels = self.dtype.itemsize if self.dtype else 1, range(first, last + 1)
        self.morton, self.offsets, self.end = self.ordering == "Morton", {}, self.start
        for level in reversed(self.levels[:32]):
            self.offsets[level] = self.end
            self.end += prod(self.size(level)) * self.sample * self.bands
        if self.tile == 0 or last > 1023 or self.end - self.start > 1 << 62:
            raise ValueError("its header tells tiles of no pixels, or more than 1024 levels or 2^62 bytes")
        self.complete = version >= [1, 1] and self.file_size >= self.end
        document = self.bytes(self.end, max(0, min(self.file_size - self.end, MOST_TEXT + 1)))
        self.records = Records(document, self.dtype, path + ".aux.xml")

    def bytes(self, offset, count):
        """Bytes of the file, and zeros behind its end."""
        with open(self.path, "rb") as file:
            file.seek(min(offset, self.file_size))
            return file.read(count).ljust(count, b"\0")

    def size(self, level):
        return (self.width >> level, self.height >> level) if level < 32 else (0, 0)

    def read(self, level=0, window=None, bands=None):
        """Samples of a window (column, row, columns, rows) of a level, as bands, rows, columns."""
        (columns, rows), side = self.size(level), self.tile
        x, y, width, height = window or (0, 0, columns, rows)
        bands = list(range(min(self.bands, MOST_TILES)) if bands is None else bands)
        if self.dtype is None or side > 2048 or level not in self.levels or not bands:
            raise ValueError(f"it gives no samples of level {level}: for its type, tiles, levels or bands")
        if min(x, y, width - 1, height - 1, *bands) < 0 or x + width > columns or y + height > rows:
            raise ValueError(f"level {level} has {columns} x {rows} pixels, less than is asked for")
        together = 1 if self.morton else self.bands  # bands in a tile
        if max(bands) >= self.bands or max(len(bands), together) * width * height * self.sample > MOST_BYTES:
            raise ValueError(f"it has {self.bands} bands, too few or too many for such a window")
        result = np.zeros((len(bands), height, width), self.dtype)
        for group in [[i] for i in range(len(bands))] if self.morton else [range(len(bands))]:
            for left, top, wide, high, at in self.tiles(level, x, y, width, height, bands[group[0]]):
                a, b = max(y, top), min(y + height, top + high)
                c, d = max(x, left), min(x + width, left + wide)
                row = wide * together * self.sample
                strip = np.frombuffer(self.bytes(at + (a - top) * row, (b - a) * row), self.dtype)
                strip = strip.reshape(b - a, wide, together)[:, c - left : d - left]
                for i in group:
                    result[i, a - y : b - y, c - x : d - x] = strip[..., 0 if self.morton else bands[i]]
        return result

    def tiles(self, level, x, y, width, height, band):
        """Column, row, columns, rows and offset of a window's tiles, until the file ends."""
        side, (columns, rows) = self.tile, self.size(level)
        places, band_bytes = self.morton_places if self.morton else ({}, 0)
        for top in range(y // side * side, y + height, side):
            for left in range(x // side * side, x + width, side):
                wide, high = min(side, columns - left), min(side, rows - top)
                at = self.offsets[level] + (columns * top + left * high) * self.bands * self.sample
                if self.morton:
                    if (level, left // side, top // side) not in places:
                        raise ValueError(f"a tile of level {level} has no place in it")
                    at = self.start + band * band_bytes + places[level, left // side, top // side]
                elif at >= self.file_size:
                    return
                yield left, top, wide, high, at

    @cached_property
    def morton_places(self):
        """Offsets of a band's tiles by (level, column, row), from its start, and its bytes."""
        across, down = (-(-size // self.tile) for size in self.size(0))
        levels = range(self.levels.start, min(self.levels.stop, 32))
        if max(across, down) > 65536 or across * down * max(self.bands, len(levels)) > MOST_TILES:
            raise ValueError(f"it has {across} x {down} tiles in Morton order, which are too many")
        sides = [[min(self.tile, size - i) for i in range(0, size, self.tile)] for size in self.size(0)]
        bits = [int(f"{number:b}", 4) for number in range(max(across, down))]
        grid = sorted(np.ndindex(across, down), key=lambda tile: bits[tile[0]] + 2 * bits[tile[1]])
        cursor, places, opened = 0, {}, {}

        def place(level, *block):
            nonlocal cursor
            spans = (side[i << level : (i + 1) << level] for side, i in zip(sides, block))
            wide, high = (sum(pixels >> level for pixels in span) for span in spans)
            if wide and high:
                places[level, *block] = cursor
                cursor += wide * high * self.sample

        for x, y in grid:
            for level in levels:
                block = (level, x >> level, y >> level)
                if opened.get(level, block) != block:
                    place(*opened[level])
                opened[level] = block
                if level == 0 or (x, y) == grid[-1]:
                    place(*opened.pop(level))
        return places, cursor


def main():
    options = argparse.ArgumentParser(description="Tells what a pyramid file holds, and reads windows of it.")
    options.add_argument("file")
    options.add_argument("--level", type=int, help="level to read, 0 is the finest")
    options.add_argument("--window", type=lambda text: [int(n) for n in text.split(",")], metavar="X,Y,W,H")
    options.add_argument("--out", metavar="FILE.npy", help="where to store bands, rows, columns")
    given = options.parse_args()
    if given.window is not None and len(given.window) != 4:
        options.error("--window takes four numbers")
    try:
        pyramid = Pyramid(given.file)
        print(f"{pyramid.width} x {pyramid.height} pixels, {pyramid.bands} bands of {pyramid.type}, ordering",
              f"{pyramid.ordering}, tiles of {pyramid.tile}, {'' if pyramid.complete else 'not '}complete")
        for level in pyramid.levels[:32]:
            print("level {}: {} x {}".format(level, *pyramid.size(level)))
        for band in range(min(pyramid.bands, len(pyramid.records.all_statistics))):
            print(f"band {band}:", *(f"{k} {v:.10g}" for k, v in pyramid.records.statistics(band).items()))
        if given.out or given.window or given.level is not None:
            pixels = pyramid.read(given.level or 0, given.window)
            print(f"read {' x '.join(map(str, pixels.shape))} samples of {pixels.dtype}")
            if given.out:
                np.save(given.out, pixels)
    except (OSError, ValueError, MemoryError) as error:
        raise SystemExit(f"read_pyramid.py: {given.file}: {error}") from None


if __name__ == "__main__":
    main()
