"""Makes hostile pyramid files: well-formed where it helps to get further in, hostile everywhere else.

A file is a `Draft`: the elements of its header, the bytes behind, a metadata document, files beside it.
Each function of MUTATIONS makes one thing of it hostile; `draft(seed)` takes a plain one of any type
and ordering and applies one to four. The same seed gives the same file.
"""
import random
import struct
import zlib

TYPES = {"Byte": 1, "Char": 1, "UInt16": 2, "Int16": 2, "UInt32": 4, "Int32": 4, "UInt64": 8,
         "Int64": 8, "Single": 4, "Double": 8, "ComplexSingle": 8, "ComplexDouble": 16}
NUMBERS = ("0", "1", "2", "3", "31", "32", "33", "63", "64", "255", "256", "257", "1023", "1024",
           "2047", "2048", "2049", "32767", "65535", "65536", "65537", "2147483647", "2147483648",
           "4294967295", "4294967296", "4294967297", "9223372036854775807", "9223372036854775808",
           "18446744073709551615", "18446744073709551616", "-1", "-2147483648", "-2147483649",
           "+5", "0x10", "010", "1e3", "1e308", "1e-400", "nan", "inf", "-inf", "", " ", "5 6", "5x",
           "9" * 400, "0" * 5000 + "7", "0." + "0" * 400 + "1", "\u0663", "NaN(1)", "1e", ".", "-")
REALS = NUMBERS + ("0.1", "-0", "1.7976931348623157e308", "5e-324", "3.5e38", "-3.5e38")
JUNK = ("<a/>", "<!-- -->", "<![CDATA[5]]>", "&#53;", "&#x35;", "&lt;", "<?pi x?>", "text",
        "<HEADER_BANDS>7</HEADER_BANDS>", "<a b='1' c='2'/>", "\n\n\n", "\t", "&amp;&amp;")
WORDS = ("Byte", "ComplexDouble", "UInt64", "Single", "byte", "Strange", "BIP", "BIL", "BSQ", "None",
         "Scanline", "Blocked", "Morton", "KOBT", "", " Morton ", "Unknown", "Double", "Bit")
ORDER = ("VERSION_MAJOR", "VERSION_MINOR", "BANDS", "PIXEL_HEIGHT", "PIXEL_WIDTH", "LEVELMIN",
         "LEVELMAX", "TILESIZE", "INTERLEAVE", "BUILD_METHOD", "PIXEL_TYPE")
DECLARATION = '<?xml version="1.0" encoding="UTF-8" standalone="no" ?>\n'


def element(name, value):
    return f"<{name}>{value}</{name}>"


class Draft:
    def __init__(self, chance):
        self.chance = chance
        self.kinds = []
        kind = chance.choice(list(TYPES))
        self.fields = {
            "VERSION_MAJOR": "1", "VERSION_MINOR": "1", "BANDS": str(chance.choice((1, 1, 2, 3, 9))),
            "PIXEL_HEIGHT": str(chance.randint(1, 40)), "PIXEL_WIDTH": str(chance.randint(1, 40)),
            "LEVELMIN": "0", "LEVELMAX": str(chance.randint(0, 2)),
            "TILESIZE": str(chance.choice((8, 16, 256))), "INTERLEAVE": "BIP",
            "BUILD_METHOD": chance.choice(("Scanline", "Blocked", "Morton")), "PIXEL_TYPE": kind}
        self.before = ""  # of the header's elements
        self.behind = ""
        self.around = ("<DATASET><HEADER>", "</HEADER></DATASET>")
        self.declaration = DECLARATION
        self.records = [self.statistics(band) for band in range(self.number("BANDS", 20))]
        self.document = None  # else in place of the records
        self.body = None  # else in place of the pixels
        self.cut = None
        self.start_shift = self.end_shift = 0
        self.front = None  # else in place of the magic and the two offsets
        self.sparse = 0  # bytes of hole behind all
        self.beside = {}

    def number(self, field, most):
        try:
            return max(0, min(int(self.fields[field]), most))
        except (KeyError, ValueError):
            return 0

    def value(self):
        return self.chance.choice(REALS)

    def statistics(self, band):
        return element("BANDSTATISTICS", element("RSTC_BAND", band) + element("RSTC_LEVEL", 0) +
                       element("RSTC_MINIMUM", 1) + element("RSTC_MAXIMUM", 200) +
                       element("RSTC_MEAN", 77.5) + element("RSTC_STANDARDDEVIATION", 12.25))

    def tile_bytes(self):
        """Bytes of the tiles as the header tells them; none where it is not a plain one."""
        try:
            width, height = int(self.fields["PIXEL_WIDTH"]), int(self.fields["PIXEL_HEIGHT"])
            low, high = int(self.fields["LEVELMIN"]), int(self.fields["LEVELMAX"])
            sample = TYPES[self.fields["PIXEL_TYPE"].strip()] * int(self.fields["BANDS"])
        except (KeyError, ValueError):
            return 0
        if not 0 <= low <= high < 1024 or min(width, height, sample) < 0:
            return 0
        return sum((width >> level) * (height >> level) * sample
                   for level in range(low, min(high, 31) + 1))

    def header(self):
        texts = "".join(element("HEADER_" + name, self.fields[name])
                        for name in ORDER if name in self.fields)
        return self.declaration + self.around[0] + self.before + texts + self.behind + self.around[1]

    def bytes(self):
        header = self.header().encode("utf-8", "surrogatepass")
        start = 20 + len(header) + self.start_shift
        size = self.tile_bytes()
        body = self.body
        if body is None:
            body = self.chance.randbytes(min(size, 1 << 20))
        document = self.document
        if document is None:
            document = (DECLARATION + "<DATASET>" + "".join(self.records) + "</DATASET>"
                        if self.records else "")
        end = start + size + self.end_shift
        front = self.front or b"KOBT" + struct.pack("<QQ", start % 2**64, end % 2**64)
        whole = front + header + body + document.encode("utf-8", "surrogatepass")
        return whole if self.cut is None else whole[:int(len(whole) * self.cut)]

    def save(self, path):
        """Writes the file and those beside it, and returns their names."""
        names = [path]
        with open(path, "wb") as file:
            file.write(self.bytes())
            if self.sparse:
                file.truncate(file.tell() + self.sparse)
        for suffix, text in self.beside.items():
            names.append(path + suffix)
            with open(path + suffix, "wb") as file:
                file.write(text() if callable(text) else text)
        return names


def some_field(draft):
    name = draft.chance.choice(ORDER)
    if name in ("INTERLEAVE", "BUILD_METHOD", "PIXEL_TYPE"):
        draft.fields[name] = draft.chance.choice(WORDS + NUMBERS)
    else:
        draft.fields[name] = draft.chance.choice(NUMBERS)


def several_fields(draft):
    for _ in range(draft.chance.randint(2, 5)):
        some_field(draft)


def missing_field(draft):
    del draft.fields[draft.chance.choice(list(draft.fields))]


def no_width_many_bands(draft):
    draft.fields.update(BANDS=draft.chance.choice(("4294967295", "2147483647", "16777216", "65537")))
    draft.fields[draft.chance.choice(("PIXEL_WIDTH", "PIXEL_HEIGHT"))] = "0"


def many_levels(draft):
    draft.fields.update(LEVELMAX=str(draft.chance.choice((31, 32, 33, 40, 63, 64, 70, 255, 1023))))


def few_pixels_many_bands(draft):
    draft.fields.update(PIXEL_WIDTH="1", PIXEL_HEIGHT="1", LEVELMAX="0",
                        BANDS=str(draft.chance.choice((1000, 65536, 65537, 1000000))))
    draft.records = []


def morton_table(draft):
    draft.fields.update(BUILD_METHOD="Morton", TILESIZE=draft.chance.choice(("1", "2", "8")),
                        PIXEL_WIDTH=draft.chance.choice(("65536", "4294967295", "20000")),
                        PIXEL_HEIGHT=draft.chance.choice(("1", "8192", "20000")))


def second_type(draft):
    word = draft.chance.choice(list(TYPES))
    wrapped = draft.chance.choice(("<X>%s</X>", "%s", "<HEADER>%s</HEADER>", "<PALETTE>%s</PALETTE>"))
    text = wrapped % element("HEADER_PIXEL_TYPE", word)
    place = draft.chance.choice(("before", "behind", "around"))
    if place == "before":
        draft.before += text
    elif place == "behind":
        draft.behind += text
    else:
        draft.around = (draft.around[0], "</HEADER>" + text + "</DATASET>")


def second_field(draft):
    text = element("HEADER_" + draft.chance.choice(ORDER[:8]), draft.chance.choice(NUMBERS))
    if draft.chance.random() < 0.5:
        draft.before += "<X>" + text + "</X>"
    else:
        draft.behind += text


def junk_in_header(draft):
    name = draft.chance.choice(ORDER)
    if name in draft.fields:
        draft.fields[name] = draft.chance.choice((
            draft.chance.choice(JUNK) + draft.fields[name],
            draft.fields[name] + draft.chance.choice(JUNK)))
    draft.behind += draft.chance.choice(JUNK)


def nested(draft):
    depth = draft.chance.choice((60, 63, 64, 65, 1000, 100000))
    text = "<a>" * depth + "</a>" * depth
    if draft.chance.random() < 0.5:
        draft.behind += text
    else:
        draft.records.append(text)


def attributes(draft):
    number = draft.chance.choice((63, 64, 65, 1000, 200000))
    text = "<a " + " ".join(f"b{i}='1'" for i in range(number)) + "/>"
    if draft.chance.random() < 0.5:
        draft.behind += text
    else:
        draft.records.append(text)


def names(draft):
    number = draft.chance.choice((255, 256, 257, 5000, 100000))
    text = "".join(f"<n{i}/>" for i in range(number))
    if draft.chance.random() < 0.5:
        draft.behind += text
    else:
        draft.records.append(text)


def long_name(draft):
    draft.behind += "<" + "n" * draft.chance.choice((1000, 100000, 2000000)) + "/>"


def document_type(draft):
    bomb = ('<!DOCTYPE d [<!ENTITY a "aaaaaaaaaaaaaaaaaaaa">' +
            "".join(f'<!ENTITY {chr(98 + i)} "{("&" + chr(97 + i) + ";") * 20}">' for i in range(9)) +
            "]>")
    outside = '<!DOCTYPE d SYSTEM "file:///etc/passwd">'
    text = DECLARATION + draft.chance.choice((bomb, outside))
    if draft.chance.random() < 0.5:
        draft.declaration = text
    else:
        draft.document = text + "<DATASET>&j;</DATASET>"


def encoding(draft):
    name = draft.chance.choice(("UTF-16", "UTF-7", "EBCDIC-CP-US", "ISO-8859-1", "x" * 5000, "US-ASCII"))
    draft.declaration = f'<?xml version="1.0" encoding="{name}"?>'


def many_statistics(draft):
    number = draft.chance.choice((1000, 5000, 20000))
    draft.records = [draft.statistics(i % 50) for i in range(number)]


def hostile_statistics(draft):
    for _ in range(draft.chance.randint(1, 20)):
        band = draft.chance.choice(NUMBERS)
        texts = "".join(element("RSTC_" + name, draft.value()) for name in draft.chance.sample(
            ("LEVEL", "MINIMUM", "MAXIMUM", "MEAN", "STANDARDDEVIATION", "SUM", "SUM2", "RMS", "COV"),
            draft.chance.randint(0, 9)))
        draft.records.append(element("BANDSTATISTICS", element("RSTC_BAND", band) + texts))


def hostile_histogram(draft):
    bins = draft.chance.choice(NUMBERS + ("1000000", "1048576", "500000"))
    counts = "|".join(draft.chance.choice(NUMBERS[:36])
                      for _ in range(draft.chance.choice((0, 1, 4, 256, 1000))))
    parts = [element("HIST_BAND", draft.chance.choice(("0", "1", "7", "4294967295"))),
             element("HIST_LEVEL", draft.chance.choice(NUMBERS[:12])), element("HIST_BINCOUNT", bins),
             element("HIST_BINSIZE", draft.value()), element("HIST_MIN", draft.value()),
             element("HIST_MAX", draft.value()), element("HIST_COUNTS", counts)]
    if draft.chance.random() < 0.3:
        draft.chance.shuffle(parts)
    draft.records.append(element("HISTOGRAMS", "".join(parts)))


def many_histograms(draft):
    number = draft.chance.choice((100, 2000))
    bins = draft.chance.choice(("256", "65536", "1048577"))
    draft.records += [element("HISTOGRAMS", element("HIST_BAND", i) + element("HIST_BINCOUNT", bins) +
                              element("HIST_COUNTS", "1|2")) for i in range(number)]


def hostile_palette(draft):
    number = draft.chance.choice((0, 1, 256, 65536, 65537))
    color = draft.chance.choice(("1|2|3|255", "300|-1|5", "", "1|2|3|4|5", "x", "|||", "9" * 400))
    draft.records.append(element("PALETTE", element("PALETTE_BAND", draft.chance.choice(NUMBERS[:12])) +
                                 element("PALETTE_COUNT", draft.chance.choice(NUMBERS)) +
                                 element("PALETTE_RGBA", color) * number))


def many_palettes(draft):
    draft.records += [element("PALETTE", element("PALETTE_BAND", i % 9) +
                              element("PALETTE_RGBA", "1|2|3|4") * 20) for i in range(2000)]


def broken_document(draft):
    text = "<DATASET>" + "".join(draft.records) + "</DATASET>"
    at = draft.chance.randint(0, len(text))
    draft.document = draft.chance.choice((
        text[:at], "\x1a" + text, text + "<", " " * 100000, "<DATASET>" * 50, text + "\0" * 1000,
        "\ufeff" + text, text.replace("</RSTC_BAND>", "</RSTC_LEVEL>"), "<DATASET/>" * 3,
        "</DATASET>" + text))


def long_text(draft):
    draft.records.append(element("BANDSTATISTICS", element("RSTC_BAND", "1" * 3000000)))


def hole_behind(draft):
    draft.sparse = draft.chance.choice((1 << 20, 1 << 28, (1 << 28) + 1, 1 << 32, 1 << 40))


def cut(draft):
    draft.cut = draft.chance.random()


def no_pixels(draft):
    draft.body = b""


def offsets(draft):
    moves = (-20, -1, 1, 1000, 2**31, 2**32, 2**62, 2**63, 2**64 - 1)
    draft.start_shift = draft.chance.choice((0,) + moves)
    draft.end_shift = draft.chance.choice((0,) + moves)


def magic(draft):
    draft.front = draft.chance.choice((b"", b"KOB", b"KOBU" + b"\0" * 16, b"KOBT", b"KOBT" + b"\xff" * 16))


def sidecar(draft):
    items = draft.chance.choice((
        "<PAMDataset>" + "<X>" * 50000, "<PAMDataset/>", "", "\0" * 1000, "<Wrong/>",
        "<PAMDataset><GeoTransform>" + draft.chance.choice(NUMBERS) + "</GeoTransform></PAMDataset>",
        "<PAMDataset><SRS>" + "A" * 100000 + "</SRS></PAMDataset>",
        "<PAMDataset><PAMRasterBand band='" + draft.chance.choice(NUMBERS) + "'><NoDataValue>" +
        draft.value() + "</NoDataValue><Histograms><HistItem><HistMin>0</HistMin><HistMax>1</HistMax>"
        "<BucketCount>" + draft.chance.choice(NUMBERS) + "</BucketCount><HistCounts>1|2"
        "</HistCounts></HistItem></Histograms></PAMRasterBand></PAMDataset>",
        "<PAMDataset><Metadata>" + "<MDI key='STATISTICS_MEAN'>1</MDI>" * 20000 +
        "</Metadata></PAMDataset>"))
    draft.beside[".aux.xml"] = items.encode()


def journal(draft):
    """A copy of a document as a store keeps it, with a sum that fits or not."""
    chance = draft.chance
    text = chance.choice(("<DATASET/>", "", "<DATASET>" * 10, "A" * 100000)).encode()
    run = b"0" * chance.choice((0, 36, 5000))
    numbers = [chance.choice((0, 1, 20, 500, 2**32, 2**63, 2**64 - 1)) for _ in range(5)]
    lengths = [len(run), len(text)]
    if chance.random() < 0.3:
        lengths[chance.randint(0, 1)] = chance.choice((0, 2**32, 2**64 - 1))
    record = b"ZMCMETA1" + struct.pack("<7Q", *numbers, *lengths) + run + text
    record += struct.pack("<Q", zlib.crc32(record) * chance.choice((1, 2**32 - 1)))
    draft.beside[".zmcmeta"] = record[:chance.choice((0, 7, 8, 60, len(record), len(record) * 2))]


MUTATIONS = (some_field, several_fields, missing_field, no_width_many_bands, many_levels,
             few_pixels_many_bands, morton_table, second_type, second_field, junk_in_header, nested,
             attributes, names, long_name, document_type, encoding, many_statistics,
             hostile_statistics, hostile_histogram, many_histograms, hostile_palette, many_palettes,
             broken_document, long_text, hole_behind, cut, no_pixels, offsets, magic, sidecar, journal)


def draft(seed):
    """The file of a number: the first ones have one hostile thing each."""
    chance = random.Random(seed)
    made = Draft(chance)
    if seed < len(MUTATIONS):
        chosen = [MUTATIONS[seed]]
    else:
        chosen = [chance.choice(MUTATIONS) for _ in range(chance.choice((1, 1, 2, 2, 3, 4)))]
    for mutate in chosen:
        made.kinds.append(mutate.__name__)
        mutate(made)
    return made
