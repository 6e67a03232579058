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


def control_file_seeds():
    # State of the files, then messages, then the control file.
    on = b"1111,1111,1111,1111\n"
    message = b"\x01\x00\x05hello"
    long = b"\x01\x01\xc8\x28" + b"0123456789" * 4
    files = {"kept": b"\0\0\0", "full": b"\0\5\5", "nearly": b"\0\3\2", "folder": b"\0\7\1",
             "second-folder": b"\0\5\7", "none": b"\6\0\0", "file": b"\7\0\0"}
    for name, state in files.items():
        yield f"logs-{name}", b"\0" + state + b"\3" + message + long + message + on
    lines = (
        b"0110,0000,0000,0001\n", b"1000,0000,0000,0001\n", b"0110, 0000, 0000, 0001\n",
        b"1,,,,,,,,,,,,,,,,,1\n", b"# notes\n \n0110,0000,0000,0001 and more\n", b"0\n" + on,
        b"#" * 1023 + on, b"#" * 1022 + on, b"0110,0000,0000,000", b"\0\n" + on,
        b"0110,0000\0,0000,0001\n",
    )
    for i, line in enumerate(lines):
        yield f"line-{i}", b"\0\0\0\0\2" + message + message + line
    yield "no-control-file", b"\x0f\0\0\0\1" + message
    yield "control-folder", b"\x0e\0\0\0\1" + message


def environment_seeds():
    def variable(value):
        return b"\1" + bytes([len(value)]) + value

    unset = b"\0\0"
    for i, (folder, level, console) in enumerate((
        (b"a", b"1", b"0"), (b"a", b"0x10", b"1"), (b"a/b", b"010", b"1"), (b"a", b"0", b"0"),
        (b"a", b"-1", b"-0"), (b"\xff\xfe", b"4294967296", b"4294967295"), (b"a/", b" +7z", b"x"),
        (b"/", b"99999999999999999999", b"0xg"),
    )):
        values = variable(folder) + variable(level) + variable(console)
        yield f"log-{i}", b"\2" + values + b"\2\1\1\5\3\x41\0\0\0\2\xfc\x40\x44\x48\0"
    yield "log-unset-folder", b"\2" + unset
    yield "log-unset-level", b"\2" + variable(b"a") + unset
    yield "log-unset-console", b"\2" + variable(b"a") + variable(b"3") + unset + b"\1\1\0\0"
    yield "table", b"\0\5\1a\1\1b\1a\1\1c\1A\0\0\1\2de\1a\0"
    for kind in (0, 1, 4, 8, 13):
        yield f"factory-{kind}", b"\1" + bytes([kind]) + b"\3bin\2pe\4gdal"


TARGETS = {
    "string": string_seeds,
    "memory_parameters": memory_parameters_seeds,
    "control_file": control_file_seeds,
    "environment": environment_seeds,
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
