"""The XML documents of a pyramid file and their numbers, after docs/format.md; for read_pyramid.py."""
import ctypes
import os
import re
import struct
from xml.etree import ElementTree
from xml.parsers import expat

import numpy as np

MOST_TEXT, MOST_ELEMENTS, MOST_DEPTH, MOST_SPARE_BINS = 1 << 28, 1 << 20, 64, 1 << 20
EMBEDDED = b'<?xml version="1.0" encoding="UTF-8" standalone="no" ?>\n<DATASET>\n\n  <SIDECAR>'
STATISTICS = "MINIMUM", "MAXIMUM", "MEAN", "STANDARDDEVIATION", "SUM", "SUM2", "RMS"
C = ctypes.CDLL(None)
C.strtod.restype, C.strtoll.restype = ctypes.c_double, ctypes.c_longlong


def decimal(text):
    return C.strtoll(text.encode(), None, 10) & 0xFFFFFFFF


def real(text):
    return C.strtod(text.encode(), None)


def pixel_value(text, dtype):
    """A value as the type of the samples keeps it: integers are cut toward zero and lose their upper bits."""
    value, dtype = real(text), np.dtype(dtype)
    if dtype.kind in "fc":
        with np.errstate(over="ignore"):
            return np.array(value).astype(dtype)[()]
    held = -(2.0**63) <= value < (2.0**64 if dtype == "u8" else 2.0**63)
    bits = (int(value) if held else -(1 << 63)) & ((1 << 8 * dtype.itemsize) - 1)
    return np.array(bits, f"u{dtype.itemsize}").view(dtype.newbyteorder("="))[()]


class Tree(ElementTree.TreeBuilder):
    depth = elements = 0

    def start(self, name, attributes):
        self.depth, self.elements = self.depth + 1, self.elements + 1
        if self.depth > MOST_DEPTH or self.elements > MOST_ELEMENTS:
            raise ValueError("a document has too many elements")
        return super().start(name, attributes)

    def end(self, name):
        self.depth -= 1
        return super().end(name)


def check_declaration(version, _encoding, _standalone):
    if not re.fullmatch(r"1\.\d+", version, re.ASCII):
        raise ValueError(f"a document is of XML {version}")


def parse(text):
    """The root of a document, which is believed whole or not at all."""
    if b"\0" in text or b"<!DOCTYPE" in text or len(text) > MOST_TEXT:
        raise ValueError("a document has a NUL or a document type, or is too long")
    tree, parser = Tree(), expat.ParserCreate()
    parser.XmlDeclHandler = check_declaration
    parser.StartElementHandler, parser.EndElementHandler = tree.start, tree.end
    parser.CharacterDataHandler = tree.data
    try:
        parser.Parse(text, True)
    except (expat.ExpatError, LookupError) as error:  # the latter of an encoding that is not known
        raise ValueError(f"a document is malformed: {error}") from error
    return tree.close()


def believed(text):
    """The root of a document, or an empty one where it is damaged or there is none."""
    try:
        return parse(text)
    except ValueError:
        return ElementTree.Element("DATASET")


def texts(parent):
    """Names and texts of an element and those inside of it that have a text, in their order."""
    pairs = ((e.tag, "".join([e.text or "", *(child.tail or "" for child in e)])) for e in parent.iter())
    return [(name, text) for name, text in pairs if text]


class Records:
    """What the metadata document tells; nothing where there is none, or a damaged one."""

    def __init__(self, document, dtype, sidecar):
        self.document, self.dtype, self.sidecar = document, np.dtype(dtype or "u1"), sidecar
        self.root = believed(document)
        self.all_statistics = [dict(texts(record)) for record in self.root.iter("BANDSTATISTICS")]

    def statistics(self, band):
        """Of minimum, maximum, mean, standarddeviation, sum, sum2 and rms those that are known."""
        bands = [decimal(record.get("RSTC_BAND", "")) for record in self.all_statistics]
        record = self.all_statistics[band] if band in bands and band < len(bands) else {}
        known = {name[5:].lower(): text for name, text in record.items() if name[5:] in STATISTICS}
        return {name: pixel_value(text, self.dtype) if name in ("minimum", "maximum") else real(text)
                for name, text in known.items()}

    def histograms(self):
        """Band, level, source, bins, size of a bin, minimum, maximum and counts, in the order of the file."""
        spare, found = MOST_SPARE_BINS, []
        for record in self.root.iter("HISTOGRAMS"):
            bins, counts, pairs = 0, [], texts(record)
            for name, text in pairs:
                if name == "HIST_BINCOUNT":
                    bins = decimal(text)
                elif name == "HIST_COUNTS":
                    entries = text.split("|")
                    if not counts and bins - len(entries) <= spare:
                        counts, spare = [0] * bins, spare - max(0, bins - len(entries))
                    entries = [int(pixel_value(entry, "u8")) for entry in entries[: min(bins, len(counts))]]
                    counts[: len(entries)] = entries
            get = {name[5:]: text for name, text in pairs}.get
            found.append(dict(
                band=decimal(get("BAND", "")), level=decimal(get("LEVEL", "")), source=get("SOURCE", ""),
                bins=bins, size=real(get("BINSIZE", "")), minimum=pixel_value(get("MIN", ""), self.dtype),
                maximum=pixel_value(get("MAX", ""), self.dtype), counts=counts))
        return found

    def palettes(self):
        """Colours (red, green, blue, alpha) of the bands that have some."""
        band, found = 0, {}
        for element in self.root.iter():
            if element.tag in ("PALETTE", "PALETTE_BAND"):
                band = ([band] + [decimal(text) for name, text in texts(element) if name == "PALETTE_BAND"])[-1]
            if element.tag == "PALETTE":
                colours = [text.split("|") for name, text in texts(element) if name == "PALETTE_RGBA"]
                found[band] = [tuple(int(pixel_value(part, "u1")) for part in (colour + [""] * 3)[:4])
                               for colour in colours]
        return found

    def no_data(self, band):
        """The value of samples without data, out of the sidecar or the file itself, or None."""
        sidecars = []
        if os.path.isfile(self.sidecar):
            with open(self.sidecar, "rb") as file:
                sidecars.append(believed(file.read(MOST_TEXT + 1)))
        domains = [e.get("domain") for tree in sidecars for e in tree.iter("Metadata")]
        if self.document.startswith(EMBEDDED) and len(self.root) and "ZMCPYRAMID_SIDECAR" not in domains:
            sidecars.append(believed((self.root[0].text or "").encode()))
        where = f"PAMRasterBand[@band='{band + 1}']/NoDataValue"
        for element in (element for tree in sidecars for element in tree.findall(where)):
            exact, text = element.get("le_hex_equiv"), element.text or ""
            if exact:
                return struct.unpack("<d", bytes.fromhex(exact))[0]
            return int(text) if text.strip().lstrip("-").isdigit() else real(text)
        return None

    def mask(self, pixels, band):
        """Which samples of a band are no data: those of its value, and those that are not finite."""
        value, kind = self.no_data(band), pixels.dtype.kind
        if kind in "fc":
            with np.errstate(invalid="ignore", over="ignore"):
                same = False if value is None else pixels == np.array(value).astype(pixels.dtype)
            return ~np.isfinite(pixels) | same
        ends = np.iinfo(pixels.dtype)
        held = value is not None and value == value // 1 and ends.min <= value <= ends.max
        return pixels == pixels.dtype.type(int(value)) if held else np.zeros(pixels.shape, bool)
