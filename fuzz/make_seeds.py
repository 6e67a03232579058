#!/usr/bin/env python3
"""Writes the seed corpora of all fuzz targets: make_seeds.py FOLDER makes FOLDER/TARGET/NAME."""

import pathlib
import struct
import sys


def string_seeds():
    yield "ascii", b"raster"
    yield "two-byte", "café".encode()
    yield "pair", "\U0001F30D".encode()
    yield "broken", b"\xed\xa0\x80\xff"


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
    yield "old-version", with_script(pyramid_file(version=(1, 0)), 2)
    yield "large-tile", with_script(pyramid_file(tile=4096), 2)
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
    yield "torn", metadata_document(statistics(0)) + b"</DATASET>"
    yield "type", b"<!DOCTYPE d [<!ENTITY e 'x'>]><DATASET>&e;</DATASET>"
    yield "deep", b"<A>" * 70 + b"</A>" * 70
    yield "names", b"<A>" + b"".join(b"<a%d/>" % i for i in range(300)) + b"</A>"
    yield "wide-text", metadata_document(statistics(0)).decode().encode("utf-16")


TARGETS = {"string": string_seeds}
TARGETS["file"] = file_seeds
TARGETS["header"] = header_seeds
TARGETS["metadata"] = metadata_seeds


def main():
    root = pathlib.Path(sys.argv[1])
    for target, seeds in TARGETS.items():
        folder = root / target
        folder.mkdir(parents=True, exist_ok=True)
        for name, data in seeds():
            (folder / name).write_bytes(data)


if __name__ == "__main__":
    main()
