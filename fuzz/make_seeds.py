#!/usr/bin/env python3
"""Writes the seed corpora of all fuzz targets: make_seeds.py FOLDER makes FOLDER/TARGET/NAME."""

import pathlib
import sys


def string_seeds():
    yield "ascii", b"raster"
    yield "two-byte", "café".encode()
    yield "pair", "\U0001F30D".encode()
    yield "broken", b"\xed\xa0\x80\xff"


TARGETS = {"string": string_seeds}


def main():
    root = pathlib.Path(sys.argv[1])
    for target, seeds in TARGETS.items():
        folder = root / target
        folder.mkdir(parents=True, exist_ok=True)
        for name, data in seeds():
            (folder / name).write_bytes(data)


if __name__ == "__main__":
    main()
