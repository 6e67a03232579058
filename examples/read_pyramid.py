#!/usr/bin/python3
"""Reads pyramid files with NumPy alone, after docs/format.md. Bands and levels count from 0.

Usage: read_pyramid.py FILE [--level N] [--window X,Y,W,H] [--out FILE.npy]
"""
import argparse
import os
import struct
import sys
from itertools import product
from math import prod

import numpy as np
from pyramid_documents import MOST_TEXT, Records, decimal, parse, texts

TYPES = dict(Byte="u1", Char="i1", UInt16="<u2", USHORT="<u2", Int16="<i2", UInt32="<u4", Int32="<i4",
             UInt64="<u8", Int64="<i8", Single="<f4", Double="<f8", ComplexSingle="<c8", ComplexDouble="<c16")
MOST_BYTES, MOST_TILES = 1 << 30, 1 << 20  # of a window; of all bands in Morton order


class Pyramid:
    def __init__(self, path):
        if not os.path.isfile(path):
            raise ValueError("there is no such file")
        self.file, self.file_size = open(path, "rb"), os.path.getsize(path)
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
        if self.tile == 0 or last > 1023:
            raise ValueError(f"its header tells tiles of {self.tile} pixels and a last level {last}")
        self.morton, self.places, self.offsets, self.end = self.ordering == "Morton", None, {}, self.start
        for level in reversed(self.levels):
            self.offsets[level] = self.end
            self.end += prod(self.size(level)) * self.sample * self.bands
        if self.end - self.start > 1 << 62:
            raise ValueError("its tiles would take more than 2^62 bytes")
        self.complete = version >= [1, 1] and self.file_size >= self.end
        document = self.bytes(self.end, max(0, min(self.file_size - self.end, MOST_TEXT + 1)))
        self.records = Records(document, self.dtype, path + ".aux.xml")

    def bytes(self, offset, count):
        """Bytes of the file, and zeros behind its end."""
        self.file.seek(min(offset, self.file_size))
        return self.file.read(count).ljust(count, b"\0")

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
        side, (columns, rows), (places, band_bytes) = self.tile, self.size(level), self.morton_places()
        for top in range(y // side * side, y + height, side):
            for left in range(x // side * side, x + width, side):
                wide, high = min(side, columns - left), min(side, rows - top)
                at = self.offsets[level] + (columns * top + left * high) * self.bands * self.sample
                if self.morton and (level, left // side, top // side) not in places:
                    raise ValueError(f"a tile of level {level} has no place in it")
                if self.morton:
                    at = self.start + band * band_bytes + places[level, left // side, top // side]
                elif at >= self.file_size:
                    return
                yield left, top, wide, high, at

    def morton_places(self):
        """Offsets of a band's tiles by (level, column, row), from its start, and its bytes."""
        if self.places or not self.morton:
            return self.places or ({}, 0)
        across, down = (-(-size // self.tile) for size in self.size(0))
        if max(across, down) > 65536 or across * down * self.bands > MOST_TILES:
            raise ValueError(f"it has {across} x {down} tiles in Morton order, which are too many")
        sides = [[min(self.tile, size - i) for i in range(0, size, self.tile)] for size in self.size(0)]
        bits = [int(f"{number:b}", 4) for number in range(max(across, down))]
        grid = sorted(product(range(across), range(down)), key=lambda tile: bits[tile[0]] + 2 * bits[tile[1]])
        cursor, places, opened = 0, {}, {}

        def place(level, *block):
            nonlocal cursor
            spans = (side[i << level : (i + 1) << level] for side, i in zip(sides, block))
            wide, high = (sum(pixels >> level for pixels in span) for span in spans)
            if wide and high:
                places[level, *block] = cursor
                cursor += wide * high * self.sample

        for x, y in grid:
            for level in [level for level in self.levels if level < 32]:
                block = (level, x >> level, y >> level)
                if opened.get(level, block) != block:
                    place(*opened[level])
                if level == 0 or (x, y) == grid[-1]:
                    place(*block)
                else:
                    opened[level] = block
        self.places = places, cursor
        return self.places


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
            mean = pixels.mean(dtype=np.result_type(pixels, "f8"))
            print(f"read {pixels.shape} of {pixels.dtype}, mean {mean:.10g}")
            if given.out:
                np.save(given.out, pixels)
    except (OSError, ValueError, MemoryError) as error:
        sys.exit(f"{sys.argv[0]}: {given.file}: {error}")


if __name__ == "__main__":
    main()
