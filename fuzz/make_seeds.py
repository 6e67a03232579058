#!/usr/bin/env python3
"""Writes the seed corpora of all fuzz targets: make_seeds.py FOLDER makes FOLDER/TARGET/NAME."""

import pathlib
import sys


def string_seeds():
    # The locale, then steps: which string, what to do, and whatever that needs.
    texts = {
        "ascii": b"raster",
        "two-byte": "café".encode(),
        "pair": "\U0001F30D".encode(),
        "broken": b"\xed\xa0\x80\xff",
        "cut": b"\xf0\x9f\x8c",
        "overlong": b"\xc0\xaf\xe0\x80\xaf\xf4\x90\x80\x80",
        "blanks": b"  BIP\r\n next\t",
        "zero": b"a\0b",
        "invisible": "a\u00ad\u200d\ufeff".encode(),
    }
    for name, text in texts.items():
        counted = bytes([len(text)]) + text
        assign = b"\0\0" + counted + b"\1\2" + counted
        ask = b"\0\x12\1\x0d\0\0\x0e" + counted + b"\1\x0f\0\0\x0c\0\x12"
        join = b"\2\7\0\1\2\7\1\0\2\7\2\1\0\x09\2\2\x0a\0\1\0\3\0\x0f\2"
        own = b"\0\6\0\0\6\1\2\0\4\1" + counted + b"\1\3\1\1\5\3"
        convert = b"\0\x13\5" + counted + b"\3\x41\0\x10\x80\x20\x80"
        for locale in (0, 1):
            yield f"{name}-{locale}", bytes([locale]) + assign + ask + join + own + convert
        yield f"tokens-{name}", b"\0\0\x11" + counted + b"\0\x12"
    yield "wide", b"\1\0\1\4\x41\0\x10\x80\x90\x80\x08\xc8\0\x0c\0\x12"


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


def size(value):
    """A size as the layout targets read it: a byte for small ones and those around powers of two."""
    for kind in range(96, 224):
        if value == (1 << (kind - 96) // 4) + (kind & 3) - 2 and value >= 96:
            return bytes([kind])
    return bytes([value]) if value < 96 else b"\xff" + value.to_bytes(4, "little")


# Samples, lines, bands, tile, lowest and highest level.
LAYOUTS = (
    (1024, 1024, 1, 256, 0, 2), (1000, 777, 2, 256, 0, 1), (1001, 513, 3, 256, 0, 3),
    (100, 100, 1, 256, 0, 7), (256, 3, 4, 256, 0, 0), (65536, 65536, 3, 256, 0, 8),
    (2**32 - 1, 2**32 - 1, 1, 2048, 0, 31), (2**32 - 256, 1, 1, 256, 0, 33), (1, 65536, 1, 1, 0, 0),
    (65537, 1, 1, 1, 0, 0), (1024, 1024, 2**32 - 1, 256, 0, 9), (64, 64, 9, 0, 0, 1),
    (64, 64, 9, 2049, 0, 1), (512, 512, 1, 2048, 5, 3), (2**31, 2**31, 1, 1024, 0, 1023),
    (300, 300, 2, 256, 2, 1024), (0, 9, 1, 256, 0, 1), (9, 9, 0, 256, 0, 1), (4096, 4096, 16, 512, 3, 9),
)


def hostile_fields():
    for i, layout in enumerate(LAYOUTS):
        for ordering in (0, 2):
            pixel_type = bytes([(i + ordering) % 14])
            yield f"{i}-{ordering}", b"".join(map(size, layout)) + pixel_type + bytes([ordering])


def small_fields():
    for pixel_type in range(14):
        for ordering in (0, 1, 2):
            bands = (1, 2, 3, 4, 9)[(pixel_type + ordering) % 5]
            tile = (3, 4, 8, 7, 12)[pixel_type % 5]
            yield f"{pixel_type}-{ordering}", bytes(
                [19, 13, bands, tile - 1, pixel_type % 2, 2, pixel_type, ordering])


def layout_seeds():
    # Behind the fields: a level and a tile, then a window and a list of bands, then what to do.
    for name, fields in hostile_fields():
        yield f"hostile-{name}", b"\x21" + fields + b"\1\1\1" + b"\1\0\5\5\x10\x10\1\xff\0\0"
        yield f"whole-{name}", b"\x20" + fields + b"\0\0\0" + b"\5\0\0\0\2\2\xff"
    for name, fields in small_fields():
        for kind, list_kind in ((1, 0), (1, 1), (1, 14), (5, 1), (5, 10), (0, 1)):
            window = bytes([kind, 0, 5, 3, 9, 8]) if kind == 1 else bytes([kind, 0, 9, 9])
            rest = bytes([list_kind, 1, 0, 2, 0xFF, 0xF, 1, 7, 1])
            yield f"small-{name}-{kind}-{list_kind}", b"\xf0" + fields + b"\1\1\0" + window + rest
    for sample in range(5):
        for layout in (b"\0\0\0", b"\1\0\0\0", b"\1\0\0\1"):
            for other in (b"\0\0\0", b"\0\1\3\0\1\2\3\4\5\6\7\0", b"\1\0\0\1"):
                name = f"move-{sample}-{layout.hex()}-{other.hex()}"
                yield name, b"\0\2\x13\x08" + bytes([sample]) + layout + other


def layout_file_seeds():
    for name, fields in hostile_fields():
        yield f"hostile-{name}", b"\1" + fields
    for name, fields in small_fields():
        yield f"small-{name}", b"\0" + fields


def control_file_seeds():
    # State of the files, then messages, then the control file.
    on = b"1111,1111,1111,1111\n"
    message = b"\x01\x00\x05hello"
    long = b"\x01\x01\xc8\x28" + b"0123456789" * 4
    files = {"kept": b"\0\0\0", "full": b"\0\5\5", "nearly": b"\0\3\2", "folder": b"\0\7\1",
             "second-folder": b"\0\5\7", "none": b"\6\0\0", "file": b"\7\0\0", "link": b"\5\0\0"}
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
        (b"blocked", b"3", b"0"),
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
    "layout": layout_seeds,
    "layout_file": layout_file_seeds,
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
