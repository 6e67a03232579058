#!/usr/bin/env python3
"""Writes the seed corpora of all fuzz targets: make_seeds.py FOLDER makes FOLDER/TARGET/NAME."""

import pathlib
import sys


def string_seeds():
    yield "ascii", b"raster"
    yield "two-byte", "café".encode()
    yield "pair", "\U0001F30D".encode()
    yield "broken", b"\xed\xa0\x80\xff"


def memory_parameters_seeds():
    # First the kind of argument; behind the string, and a zero, the steps of the tiles. The byte 1
    # stands for the address of the buffer.
    steps = bytes(range(1, 120))
    for pixel_type in (1, 2, 3, 4, 5, 6, 9, 12, 13, 14, 15, 99):
        for interleave in (-1, 0, 1, 2):
            text = (
                f"SAMPLES=5;LINES=4;BANDS=3;INTERLEAVE={interleave};PIXELTYPE={pixel_type};"
                "PIXELSIZE=1,1;TIEPTMAP=0,0;NAME=scene;PIXELDATA=\x01"
            )
            yield f"type-{pixel_type}-{interleave}", b"\x05" + text.encode() + b"\0" + steps
    full = (
        b"SAMPLES=0x10;LINES=010;BANDS=2;INTERLEAVE=2;PIXELTYPE=12;PIXELSIZE=1e400,-.5;"
        b"TIEPTMAP=,0,,0,;FILENAME=x;PIXELDATA=\x02;"
    )
    for kind in range(8):
        yield f"kind-{kind}", bytes([kind]) + full + b"\0" + steps
    for key in (b"LINES", b"=", b",", b"A;", b"PIXELSI"):
        yield f"key-{key.decode()}", bytes([len(key) << 5 | 5]) + key + full
    # Numbers outside the range of a double, however they are written.
    zeros = b"0" * 400
    for name, pair in (
        ("tiny", b"0." + zeros + b"1,1e-400"),
        ("tiny-scaled", b"0." + zeros + b"1e5,-." + zeros + b"9e+9"),
        ("huge", b"9" + zeros + b",-1e400"),
        ("huge-scaled", b"9" + zeros + b"e-5,12" + zeros + b".5e-9"),
    ):
        yield f"pair-{name}", b"\x25K" + b"K=" + pair
    yield "many-bands", b"\x05" + full.replace(b"BANDS=2", b"BANDS=0x7fffffff") + b"\0" + steps
    yield "negative", b"\x05" + full.replace(b"=010", b"=-5") + b"\0" + steps
    yield "no-data", b"\x05" + full.replace(b"\x02", b"zz") + b"\0" + steps


TARGETS = {
    "string": string_seeds,
    "memory_parameters": memory_parameters_seeds,
}


def main():
    root = pathlib.Path(sys.argv[1])
    for target, seeds in TARGETS.items():
        folder = root / target
        folder.mkdir(parents=True, exist_ok=True)
        for name, data in seeds():
            (folder / name).write_bytes(data)


if __name__ == "__main__":
    main()
