#!/usr/bin/env python3
"""Writes the seed corpora of all fuzz targets: make_seeds.py FOLDER makes FOLDER/TARGET/NAME."""

import pathlib
import struct
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
    yield "case", b"\0\0\0\6raster\1\0\6raSter\0\x0d\1\0\x0e\6Raster"
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
    for number in (b"4294967295", b"4294967296", b"-4294967295", b"-4294967296", b"2147483647",
                   b"2147483648", b"-2147483648", b"-2147483649", b"0xFFFFFFFF", b"040000000000"):
        yield f"number-{number.decode()}", b"\x25K" + b"K=" + number
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
    (1, 65537, 1, 1, 0, 0), (65536, 65536, 1, 1, 0, 0), (256, 256, 8191, 1, 0, 0),
    (256, 256, 8192, 1, 0, 0), (2**31, 2**31, 1, 2048, 0, 0), (2**31, 2**31, 2, 2048, 0, 0),
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
        above = bytes([fields[5] + fields[4] + 1])
        yield f"above-{name}", b"\xf0" + fields + b"\1\1\0" + b"\x09" + above + b"\0\0\1\1\1"
    # Rows and pixels that no run of a transfer holds: in part and as a whole, all bands and some.
    for name, fields in (("row", (3, 2, 4100, 3, 0, 0)), ("pixel", (2, 2, 8193, 2, 0, 0))):
        header = b"\x21" + b"".join(map(size, fields)) + b"\x0b\0" + b"\0\0\0"
        for part, window in (("part", b"\1\0\1\0\1\1"), ("whole", b"\5\0\0\0")):
            for bands, numbers in (("all", b"\0"), ("some", b"\x0a\x03\xff\0\x10\0\0")):
                yield f"long-{name}-{part}-{bands}", header + window + numbers + b"\xff\0\1\7\1"
    # As many bytes as a transfer may have, and one more.
    whole = b"\x21" + b"".join(map(size, (65536, 65536, 1, 256, 0, 0))) + b"\0\0\0\0\0\1\0\0\0"
    yield "transfer-limit", whole + size(65536) + size(65536) + b"\0\xff"
    yield "transfer-below", whole + size(65535) + size(65536) + b"\0\xff"
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
    # The line that fills a file to its limit, and one that is a byte longer.
    for length in (8, 9):
        filling = b"\1\0" + bytes([length]) + b"x" * length
        yield f"fill-{length}", b"\0\0\3\2\1" + filling + on
    lines = (
        b"0110,0000,0000,0001\n", b"1000,0000,0000,0001\n", b"0110, 0000, 0000, 0001\n",
        b"1,,,,,,,,,,,,,,,,,1\n", b"# notes\n \n0110,0000,0000,0001 and more\n", b"0\n" + on,
        b"#" * 1023 + on, b"#" * 1022 + on, b"0110,0000,0000,000", b"\0\n" + on,
        b"0110,0000\0,0000,0001\n",
    )
    for i, line in enumerate(lines):
        yield f"line-{i}", b"\0\0\0\0\2" + message + message + line
    yield "no-data-folder", b"\x0d\0\0\0\1" + message + on
    yield "no-control-file", b"\x0f\0\0\0\1" + message
    yield "control-folder", b"\x0e\0\0\0\1" + message


def environment_seeds():
    def variable(value):
        return b"\1" + bytes([len(value)]) + value

    unset = b"\0\0"
    for i, (folder, level, console) in enumerate((
        (b"a", b"1", b"0"), (b"a", b"0x10", b"1"), (b"a/b", b"010", b"1"), (b"a", b"0", b"0"),
        (b"a", b"-1", b"-0"), (b"\xff\xfe", b"4294967296", b"4294967295"), (b"a/", b" +7z", b"x"),
        (b"blocked", b"3", b"0"), (b"a", b"-4294967295", b"-4294967296"),
        (b"/", b"99999999999999999999", b"0xg"),
    )):
        values = variable(folder) + variable(level) + variable(console)
        yield f"log-{i}", b"\2" + values + b"\2\1\1\5\3\x41\0\0\0\2\xfc\x40\x44\x48\0"
    yield "log-unset-folder", b"\2" + unset
    yield "log-unset-level", b"\2" + variable(b"a") + unset
    yield "log-unset-console", b"\2" + variable(b"a") + variable(b"3") + unset + b"\1\1\0\0"
    yield "table", b"\0\5\1a\1\1b\1a\1\1c\1A\0\0\1\2de\1a\0"
    for kind in (0, 1, 4, 8, 13, 136, 200):
        yield f"factory-{kind}", b"\1" + bytes([kind]) + b"\3bin\2pe\4gdal"


SAMPLE_BYTES = {"Byte": 1, "Char": 1, "UInt16": 2, "Int16": 2, "UInt32": 4, "Int32": 4,
                "UInt64": 8, "Int64": 8, "Single": 4, "Double": 8, "ComplexSingle": 8,
                "ComplexDouble": 16}


def header_document(width=10, height=6, bands=1, tile=4, levels=(0, 2), pixel_type="Byte",
                    order="Blocked", interleave="BIP", version=(1, 1)):
    fields = {"VERSION_MAJOR": version[0], "VERSION_MINOR": version[1], "BANDS": bands,
              "PIXEL_HEIGHT": height, "PIXEL_WIDTH": width, "LEVELMIN": levels[0],
              "LEVELMAX": levels[1], "TILESIZE": tile, "INTERLEAVE": interleave,
              "BUILD_METHOD": order, "PIXEL_TYPE": pixel_type}
    body = "".join(f"<HEADER_{name}>{value}</HEADER_{name}>" for name, value in fields.items())
    return f"<DATASET><HEADER>{body}</HEADER></DATASET>".encode()


def statistics(band):
    return (f"<BANDSTATISTICS><RSTC_BAND>{band}</RSTC_BAND><RSTC_LEVEL>0</RSTC_LEVEL>"
            "<RSTC_MINIMUM>3</RSTC_MINIMUM><RSTC_MAXIMUM>251</RSTC_MAXIMUM>"
            "<RSTC_MEAN>118.25</RSTC_MEAN><RSTC_STANDARDDEVIATION>41.5</RSTC_STANDARDDEVIATION>"
            "<RSTC_SUM>1e9</RSTC_SUM><RSTC_SUM2>1e12</RSTC_SUM2><RSTC_RMS>0.5</RSTC_RMS>"
            "</BANDSTATISTICS>")


HISTOGRAM = ("<HISTOGRAMS><HIST_BAND>0</HIST_BAND><HIST_LEVEL>0</HIST_LEVEL>"
             "<HIST_SOURCE>ORVA</HIST_SOURCE><HIST_BINCOUNT>4</HIST_BINCOUNT>"
             "<HIST_BINSIZE>64</HIST_BINSIZE><HIST_MIN>0</HIST_MIN><HIST_MAX>255</HIST_MAX>"
             "<HIST_COUNTS>120|4000|5120|16</HIST_COUNTS></HISTOGRAMS>")
PALETTE = ("<PALETTE><PALETTE_BAND>0</PALETTE_BAND><PALETTE_COUNT>2</PALETTE_COUNT>"
           "<PALETTE_RGBA>0|0|0|255</PALETTE_RGBA><PALETTE_RGBA>255|0|0|255</PALETTE_RGBA>"
           "</PALETTE>")


def metadata_document(*records):
    return f"<DATASET>{''.join(records)}</DATASET>".encode()


def pyramid_file(metadata=b"", **header):
    """A complete file; the tile data is made up."""
    values = {"width": 10, "height": 6, "bands": 1, "levels": (0, 2), "pixel_type": "Byte"}
    values.update(header)
    document = header_document(**header)
    size = SAMPLE_BYTES[values["pixel_type"]] * values["bands"] * sum(
        (values["width"] >> level) * (values["height"] >> level)
        for level in range(values["levels"][0], values["levels"][1] + 1))
    start = 20 + len(document)
    pixels = bytes(i * 37 & 255 for i in range(size))
    return b"KOBT" + struct.pack("<QQ", start, start + size) + document + pixels + metadata


# Operations of the file target: a byte of mode, then reads, writes, stores, queries, reopening.
SCRIPTS = [
    bytes([0, 0, 0, 0, 0, 0, 8, 0, 1, 0, 127, 1, 2, 12, 8, 1, 2, 0, 10, 1, 12]),
    bytes([0, 5, 0, 0, 0, 9, 1, 36, 0, 0, 1, 2, 77, 2, 4, 1, 5, 3, 6, 1, 2, 100, 11, 12]),
    bytes([0, 8, 2, 0, 1, 3, 9, 8, 7, 6, 5, 4, 3, 2, 1, 0, 10, 0, 14, 3, 1, 12]),
    bytes([0, 13, 0, 20, 0, 1, 1, 2, 64, 5, 9, 0, 0, 0, 1, 12, 15, 3, 0, 0, 1, 1, 5, 0, 0, 0, 3]),
    bytes([15, 5, 1, 0, 0, 3, 8, 0, 15, 1, 0, 0, 1, 9, 1, 2]),
]


def with_script(data, number):
    script = SCRIPTS[number % len(SCRIPTS)]
    return data + script + bytes([len(script)])


def file_seeds():
    metadata = metadata_document(statistics(0), statistics(1), HISTOGRAM, PALETTE)
    number = 0
    for order in ("Scanline", "Blocked", "Morton"):
        for pixel_type in SAMPLE_BYTES:
            number += 1
            data = pyramid_file(metadata if number % 2 else b"", bands=number % 3 + 1,
                                order=order, pixel_type=pixel_type,
                                interleave=("BIP", "BIL", "BSQ", "None")[number % 4])
            yield f"{order}-{pixel_type}", with_script(data, number)
        for number in range(len(SCRIPTS)):
            data = pyramid_file(metadata, order=order, width=37, height=21, tile=8, bands=2)
            yield f"{order}-tiles-{number}", with_script(data, number)
        yield f"{order}-cut", with_script(pyramid_file(order=order)[:-20], 1)
        yield f"{order}-odd-tile", with_script(pyramid_file(order=order, tile=3), 0)
        yield f"{order}-bands", with_script(pyramid_file(order=order, bands=20, tile=5), 0)
    # Rows, and single pixels, beyond what the module moves at a time; the pixels are not there yet.
    rows = {"width": 256, "height": 2, "bands": 64, "tile": 256, "levels": (0, 0),
            "pixel_type": "ComplexDouble"}
    pixels = {"width": 2, "height": 3, "bands": 70000, "tile": 256, "levels": (0, 0)}
    for number, script in enumerate((
            bytes([0, 5, 36, 0, 0, 3, 2, 0, 0, 77, 0, 36, 0, 0, 3, 2, 0, 0, 0, 12]),
            bytes([0, 5, 36, 0, 4, 1, 9, 7, 3, 2, 0, 0, 77, 0, 36, 0, 4, 1, 9, 7, 3, 2, 0, 0, 12]),
            bytes([0, 5, 36, 0, 7, 0, 1, 0, 0, 77, 0, 36, 0, 7, 0, 1, 0, 0, 12]),
            bytes([0, 5, 36, 0, 4, 0, 9, 0, 0, 0, 1, 0, 0, 0, 7, 0, 36, 0, 4, 0, 9, 0, 0, 0, 1]))):
        for name, header in (("rows", rows), ("pixels", pixels)):
            front = pyramid_file(**header)
            front = front[:struct.unpack_from("<Q", front, 4)[0]]
            yield f"wide-{name}-{number}", front + script + bytes([len(script)])
    yield "old-version", with_script(pyramid_file(version=(1, 0)), 2)
    yield "large-tile", with_script(pyramid_file(tile=4096), 2)
    yield "other-kind", with_script(b"II*\0" + bytes(40), 0)
    yield "no-bytes", with_script(b"", 0)
    yield "malformed", with_script(pyramid_file(metadata[:-12]), 2)
    yield "no-type", with_script(pyramid_file().replace(b">Byte<", b">Quad<"), 2)


def header_seeds():
    for order in ("Scanline", "Blocked", "Morton", "Other"):
        yield order, header_document(order=order)
    for pixel_type in list(SAMPLE_BYTES) + ["Quad", "ComplexQuad", "Bool", "USHORT", " Byte "]:
        yield f"type-{pixel_type.strip()}", header_document(pixel_type=pixel_type, bands=3)
    yield "wide", header_document(width=16777216, tile=256, order="Morton")
    yield "huge", header_document(width=4294967295, height=4294967295, tile=2048, levels=(0, 31))
    yield "tall", header_document(height=65536, tile=1, width=1, order="Morton", levels=(0, 1))
    yield "levels", header_document(levels=(3, 1023))
    yield "no-levels", header_document(levels=(5, 2))
    yield "bands", header_document(bands=4294967295)
    yield "empty", header_document(width=0, height=0)
    yield "declared", b'<?xml version="1.0" encoding="UTF-8"?>\n' + header_document() + b"\n"
    yield "odd", (b"<DATASET a='1'><!-- c --><X>1</X><HEADER><HEADER_TILESIZE>1<![CDATA[2]]>"
                  b"</HEADER_TILESIZE><HEADER_BANDS>&#49;0x</HEADER_BANDS><?p i?></HEADER></DATASET>")
    yield "type", b"<!DOCTYPE d [<!ENTITY e 'x'>]>" + header_document()
    yield "deep", b"<A>" * 70 + b"</A>" * 70
    yield "names", b"<A>" + b"".join(b"<a%d/>" % i for i in range(300)) + b"</A>"
    yield "attributes", b"<A " + b" ".join(b"a%d='1'" % i for i in range(70)) + b"/>"


def metadata_seeds():
    yield "all", metadata_document(statistics(0), statistics(1), HISTOGRAM, PALETTE)
    yield "none", b""
    yield "empty", metadata_document()
    yield "declared", (b'<?xml version="1.0" encoding="UTF-8" standalone="no" ?>\n' +
                       metadata_document(PALETTE, PALETTE, HISTOGRAM) + b"\n\n")
    yield "numbers", metadata_document(*(
        f"<BANDSTATISTICS><RSTC_MINIMUM>{text}</RSTC_MINIMUM><RSTC_MEAN>{text}</RSTC_MEAN>"
        "</BANDSTATISTICS>" for text in ("-1", "1e999", "-1e999", "nan", "inf", "0x1F", "1.5 2.5",
                                         "18446744073709551615", "1e-400", "+7", "", " ")))
    yield "bins", metadata_document(
        "<HISTOGRAMS><HIST_BINCOUNT>1000</HIST_BINCOUNT><HIST_COUNTS>1</HIST_COUNTS>"
        "</HISTOGRAMS>", "<HISTOGRAMS><HIST_BINCOUNT>4294967295</HIST_BINCOUNT>"
        "<HIST_COUNTS>1|2</HIST_COUNTS></HISTOGRAMS>",
        "<HISTOGRAMS><HIST_COUNTS>1|2</HIST_COUNTS><HIST_BINCOUNT>2</HIST_BINCOUNT></HISTOGRAMS>")
    yield "nested", metadata_document(
        f"<PALETTE>{statistics(2)}<PALETTE><PALETTE_BAND>1</PALETTE_BAND></PALETTE>"
        f"<PALETTE_COUNT>4000000000</PALETTE_COUNT>{HISTOGRAM}</PALETTE>",
        "<RSTC_MEAN>1</RSTC_MEAN><HIST_BAND>1</HIST_BAND><PALETTE_RGBA>1</PALETTE_RGBA>")
    yield "pieces", metadata_document(
        "<BANDSTATISTICS><RSTC_BAND>1<!-- c -->2</RSTC_BAND><RSTC_SUM>&#49;<![CDATA[2]]></RSTC_SUM>"
        "<RSTC_SUMXY>1</RSTC_SUMXY><?p i?></BANDSTATISTICS>",
        "<HISTOGRAMS><HIST_SOURCE>Native</HIST_SOURCE><HIST_SOURCE>Dynamic</HIST_SOURCE>"
        "<HIST_TYPE>1</HIST_TYPE></HISTOGRAMS>")
    yield "cut", metadata_document(statistics(0), HISTOGRAM)[:-9]
    for length in range(12):
        yield f"padded-{length}", metadata_document(statistics(1), HISTOGRAM) + b"\n" * length
    yield "long", metadata_document(statistics(0)) + b" \n" * 1500
    yield "torn", metadata_document(statistics(0)) + b"</DATASET>"
    yield "type", b"<!DOCTYPE d [<!ENTITY e 'x'>]><DATASET>&e;</DATASET>"
    yield "deep", b"<A>" * 70 + b"</A>" * 70
    yield "names", b"<A>" + b"".join(b"<a%d/>" % i for i in range(300)) + b"</A>"
    # From a third of the text on it tells what to store: a histogram, and one that is refused.
    refused = b"<DATASET><!--aaaaaaa!aaaZg--></DATASET>"
    for length in range(3):
        yield f"refused-{length}", refused + b"\n" * length
    yield "wide-text", metadata_document(statistics(0)).decode().encode("utf-16")


def wide_format_seeds():
    # Flags, width and precision; then text in front and the room, and what is formatted.
    numbers = {"none": b"\0\0", "fixed": b"\0\1\3\1\1\2", "stars": b"\2\0\4\2\4\1\1\2\3\0"}
    for name, start in numbers.items():
        for kind in range(6):
            for letter in range(4):
                rest = bytes([2, 1, kind, letter, letter, 1, 5]) + b"some text\0\x2a"
                yield f"{name}-{kind}-{letter}", b"\1" + start + rest
    yield "short", b"\1\0\0\0\2\0\4\3\0\0\5hello"
    for broken in range(15):
        yield f"broken-{broken}", bytes([15, broken, 19])


# Bytes of all kinds, so that each of the first steps of a script does something else.
STEPS = [bytes((start * 37 + i * 29 + (i * i * start) % 11) % 256 for i in range(60))
         for start in range(12)]


def plain_files():
    metadata = metadata_document(statistics(0), statistics(1), HISTOGRAM, PALETTE)
    for order in ("Scanline", "Blocked", "Morton"):
        for number, pixel_type in enumerate(SAMPLE_BYTES):
            yield f"{order}-{pixel_type}", pyramid_file(
                metadata if number % 3 else b"", bands=number % 3 + 1, order=order, width=37,
                height=21, tile=8, pixel_type=pixel_type)
    yield "cut", pyramid_file()[:-20]
    yield "old", pyramid_file(version=(1, 0))
    yield "malformed", pyramid_file(metadata[:-12])
    yield "second-set", pyramid_file(metadata_document(statistics(0), statistics(0), statistics(1)),
                                     bands=2)
    large = b"<HEADER_PIXEL_TYPE>ComplexDouble</HEADER_PIXEL_TYPE>"
    for name, header in (
            ("behind", header_document().replace(b"</DATASET>", b"<X>" + large + b"</X></DATASET>")),
            ("inside", header_document().replace(b"</HEADER>", b"<X>" + large + b"</X></HEADER>"))):
        front = b"KOBT" + struct.pack("<QQ", 20 + len(header), 0) + header
        yield f"two-types-{name}", front + bytes(2000)


def driver_seeds():
    sidecar = (b"<PAMDataset><SRS>EPSG:4326</SRS><PAMRasterBand band='1'><NoDataValue>0"
               b"</NoDataValue><ColorInterp>Red</ColorInterp></PAMRasterBand>"
               b"<Metadata domain='OVERVIEWS'><MDI key='OVERVIEW_FILE'>/vsimem/a.pyr</MDI>"
               b"</Metadata></PAMDataset>")
    for number, (name, data) in enumerate(plain_files()):
        second = sidecar if number % 2 else b""
        for update in (0, 1):
            script = bytes([update]) + STEPS[(number + 5 * update) % len(STEPS)]
            yield f"{name}-{update}", (data + second + struct.pack("<H", len(second)) + script +
                                       bytes([len(script)]))


    inside = sidecar.decode().replace("<", "&lt;").replace(">", "&gt;")
    document = ('<?xml version="1.0" encoding="UTF-8" standalone="no" ?>\n<DATASET>\n\n  <SIDECAR>' +
                inside + "</SIDECAR>" + statistics(0) + "</DATASET>").encode()
    for number, second in enumerate((b"", sidecar)):
        for update in (0, 1):
            script = bytes([update]) + STEPS[(number + 5 * update) % len(STEPS)]
            yield f"embedded-{number}-{update}", (pyramid_file(document) + second +
                                                  struct.pack("<H", len(second)) + script +
                                                  bytes([len(script)]))


def host_seeds():
    for number, (name, data) in enumerate(plain_files()):
        for kind in (0, 6):
            script = STEPS[(number + kind) % len(STEPS)]
            yield f"{name}-{kind}", data + script + bytes([len(script)])


def journal_seeds():
    text = metadata_document(statistics(0))
    for name, data in plain_files():
        for script in (b"\0", b"\1\0" + bytes(6), b"\1\1" + bytes(6), b"\1\1\7\62\0\0\0"):
            yield f"{name}-{script.hex()}", (data + text + struct.pack("<H", len(text)) + script +
                                             bytes([len(script)]))


def arguments_seeds():
    texts = {
        0: (b"0", b"42", b"18446744073709551615", b"18446744073709551616", b"-1", b" 1"),
        1: (b"1.5", b"-1e308", b"1e999", b"nan", b"-inf", b"0x1p-3", b"1e-400"),
        2: (b"512K", b"256MiB", b"2gb", b"18446744073709551615K", b"B", b"1.5G"),
        3: (b"1,2,3", b"3,,1", b"4294967297", b"1,", b"0"),
        4: (b"0,0,5,5", b"1,1,18446744073709551615,1", b"1,2,3", b"9,9,1,1"),
        5: (b"a.pyr\0--method\0nearest", b"--co\0a=b\0--co=c\0-q\0a.pyr", b"--help",
            b"--\0-t", b"-m=x\0a", b"--flag=false\0a\0b"),
    }
    for kind, values in texts.items():
        for number, value in enumerate(values):
            front = {0: b"\0", 3: b"\7", 4: b"\x0a\x0a"}.get(kind, b"")
            yield f"{kind}-{number}", bytes([kind]) + front + value


def serve_seeds():
    targets = (
        b"/", b"/api", b"/healthz", b"/metrics", b"/files/a.pyr", b"/files/sub%2fm.pyr",
        b"/files/..%2f..%2fetc%2fpasswd", b"/files/%2e%2e/a.pyr", b"/files/text.pyr",
        b"/tiles/a.pyr/0/0/0.raw", b"/tiles/sub/m.pyr/0/0/0.npy?bands=9,1",
        b"/tiles/a.pyr/0/0/0.png?bands=3,2,1&stretch=p2,98&gamma=1.5&nodata=0",
        b"/tiles/a.pyr/0/0/0.webp?bands=1&colormap=-turbo&quality=20",
        b"/tiles/a.pyr/0/0/0.jpg?hillshade=1&azimuth=30&altitude=60&zfactor=2&bands=2",
        b"/tiles/a.pyr/0/0/0.png?expression=(b1-b2)/(b1%2bb2)&stretch=-1,1&depth=16",
        b"/tiles/a.pyr/tile.json", b"/tiles/a.pyr/-1/4294967296/0x1.raw",
        b"/preview/a.pyr.png?size=40&window=1,2,30,20&legend=1&bands=1&colormap=viridis",
        b"/view/a.pyr?screen=40,30", b"/view/sub/m.pyr?screen=9,9&at=1.5,-2e9&zoom=0.25&bands=9",
        b"/statistics/a.pyr", b"/histogram/sub/m.pyr?band=9", b"/info/a.pyr",
        b"/point/a.pyr?x=89&y=69&level=0&bands=1", b"/profile/a.pyr?line=0,0.5,90,70&samples=9",
        b"/window/a.pyr.npy?window=1,2,3,4&level=0&bands=2", b"/dzi/a.pyr.dzi?format=webp", b"/dzi/sub/m.pyr_files/3/0_0.png?bands=9&gamma=2",
        b"/iiif/sub%2fm.pyr%3Fbands=2/info.json", b"/iiif/a.pyr",
        b"/iiif/a.pyr/pct:10,10.5,50,50/^!40,9/!90/gray.png?stretch=p2,98",
        b"/iiif/a.pyr/square/,30/270/bitonal.jpg", b"/iiif/a.pyr/1,2,30,40/^pct:150/0/color.webp",
        b"/%00%ff?a=%", b"a")
    targets += (
        b"/ogc", b"/ogc/conformance?f=json", b"/ogc/api", b"/ogc/collections?limit=1&offset=1",
        b"/ogc/collections/sub~2Fm.pyr", b"/ogc/tileMatrixSets", b"/ogc/tileMatrixSets/own-a.pyr",
        b"/ogc/tileMatrixSets/WebMercatorQuad", b"/ogc/collections/a.pyr/map/tiles",
        b"/ogc/collections/a.pyr/map/tiles/WebMercatorQuad?stretch=0,9&quality=3",
        b"/ogc/collections/a.pyr/map/tiles/own-a.pyr/0/0/0?f=webp",
        b"/ogc/collections/a.pyr/map/tiles/WebMercatorQuad/5/11/17?resampling=cubic&depth=16",
        b"/ogc/collections/a.pyr/map/tiles/WebMercatorQuad/24/6007466/9049434?f=jpeg",
        b"/wmts/1.0.0/WMTSCapabilities.xml?gamma=2", b"/wmts/1.0.0/a.pyr/WMTSCapabilities.xml",
        b"/wmts?SERVICE=WMTS&REQUEST=GetCapabilities&AcceptVersions=1.0.0",
        b"/wmts?service=WMTS&request=GetTile&version=1.0.0&layer=a.pyr&style=default"
        b"&format=image/png&tilematrixset=WebMercatorQuad&tilematrix=6&tilerow=23&tilecol=34",
        b"/wmts?service=WMTS&request=GetFeatureInfo&version=1.0.0&layer=sub~2Fm.pyr&style="
        b"&format=image/jpeg&tilematrixset=own-sub~2Fm.pyr&tilematrix=0&tilerow=0&tilecol=0"
        b"&i=3&j=4&infoformat=text/plain",
        b"/wmts/1.0.0/a.pyr/default/WebMercatorQuad/6/23/34.png?resampling=nearest",
        b"/wmts/1.0.0/a.pyr/default/own-a.pyr/0/0/0/69/89.json")
    headers = (
        b"", b"\nRange: bytes=0-9\nIf-Range: \"x\"", b"\nRange: bytes=-5,9-",
        b"\nAccept-Encoding: zstd;q=0.5, gzip", b"\nIf-None-Match: *",
        b"\nIf-Modified-Since: Sun, 06 Nov 1994 08:49:37 GMT\nRange: bytes=99999999999999999999-",
        b"\nAccept: image/webp;q=0.3, image/*;q=0.2, */*;q=0",
        b"\nIf-Match: W/\"a\", \"b\"\nIf-Unmodified-Since: Sunday, 06-Nov-94 08:49:37 GMT")
    for number, target in enumerate(targets):
        yield str(number), target + headers[number % len(headers)]


TARGETS = {
    "serve": serve_seeds,
    "driver": driver_seeds,
    "differential": host_seeds,
    "host": host_seeds,
    "journal": journal_seeds,
    "arguments": arguments_seeds,
    "string": string_seeds,
    "memory_parameters": memory_parameters_seeds,
    "layout": layout_seeds,
    "layout_file": layout_file_seeds,
    "control_file": control_file_seeds,
    "environment": environment_seeds,
    "file": file_seeds,
    "header": header_seeds,
    "metadata": metadata_seeds,
    "wide_format": wide_format_seeds,
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
