"""The reader of examples/read_pyramid.py, which knows docs/format.md alone, against the module: every sample
of every level, masks, statistics, histograms and palettes of files drawn at random, and of damaged ones.

The day fixes what is drawn, ZMC_CAMPAIGN_PHASE fixes the day, and ZMC_CAMPAIGN=full draws more."""
import hashlib
import json
import os
import random
import re
import resource
import struct
import subprocess
import sys
import tempfile
import time
import unittest

import numpy as np
from osgeo import gdal

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "../../examples"))
from read_pyramid import TYPES, Pyramid  # noqa: E402

FULL = os.environ.get("ZMC_CAMPAIGN") == "full"
PHASE = int(os.environ.get("ZMC_CAMPAIGN_PHASE", time.time() // 86400))
FILES = 500 if FULL else 40
DAMAGED = 2000 if FULL else 200
READER = os.path.join(os.path.dirname(os.path.abspath(__file__)), "../../examples/read_pyramid.py")

GDAL_TYPES = {
    "Byte": gdal.GDT_Byte, "Char": gdal.GDT_Byte, "UInt16": gdal.GDT_UInt16, "Int16": gdal.GDT_Int16,
    "UInt32": gdal.GDT_UInt32, "Int32": gdal.GDT_Int32, "UInt64": gdal.GDT_UInt64, "Int64": gdal.GDT_Int64,
    "Single": gdal.GDT_Float32, "Double": gdal.GDT_Float64, "ComplexSingle": gdal.GDT_CFloat32,
    "ComplexDouble": gdal.GDT_CFloat64}
SIDES = [1, 2, 3, 7, 16, 64, 100, 128, 255, 256, 257, 512, 1000, 2048]
NUMBERS = ["0", "1", "2", "3.9", " 7", "-5", "-1", "+12", "300", "0x10", "0x.8", "0x1p-3", "1e3", "1e400",
           "-1e400", "1e-400", "nan", "inf", "-Infinity", "4294967297", "9223372036854775807",
           "9223372036854775808", "18446744073709551615", "99999999999999999999999", "x", "12 13", "1,5"]
HEADER_NUMBERS = ["0", "1", "2", "3", "7", "31", "32", "255", "256", "300", "1023", "1024", "2048", "2049",
                  "65535", "65537", "2147483648", "4294967295", "4294967296", "-1", "1e3", " 5", "x"]
WORDS = {"PIXEL_TYPE": [*TYPES, "Quad", "Bool", "byte", "Single x"],
         "BUILD_METHOD": ["Scanline", "Blocked", "Morton", "blocked", "Blocked ", "Spiral"]}
NUMERIC = ["BANDS", "PIXEL_WIDTH", "PIXEL_HEIGHT", "TILESIZE", "LEVELMIN", "LEVELMAX", "VERSION_MINOR"]


def tool(*arguments):
    done = subprocess.run([os.environ["ZMC_TOOL"], *arguments], capture_output=True, text=True, timeout=120)
    if done.returncode:
        raise AssertionError(f"{arguments}: {done.stderr}")
    return done.stdout


def header_field(name, text, header):
    return re.sub(f"(?<=<HEADER_{name}>)[^<]*", lambda _: text, header)


def assembled(header, rest):
    header = header.encode()
    return struct.pack("<4sQQ", b"KOBT", 20 + len(header), 20 + len(header)) + header + rest


def content_of(name):
    with open(name, "rb") as file:
        return file.read()


def parts(content):
    """Header document, and what stands behind it."""
    start = struct.unpack_from("<Q", content, 4)[0]
    return content[20:start].decode(), content[start:]


def samples(generator, kind, shape):
    """Few values each, so that the value without data comes up."""
    values = generator.integers(-3 if kind in ("Char", "Int16", "Int32", "Int64") else 0, 90, shape)
    if kind in ("Single", "Double", "ComplexSingle", "ComplexDouble"):
        values = values * 0.25 + (1j * generator.random(shape) if kind.startswith("Complex") else 0)
    return values.astype(TYPES[kind])


def metadata(luck, bands, kind):
    """Records as other writers may have stored them: out of order, in odd places, with odd numbers."""
    number = lambda: luck.choice(NUMBERS)  # noqa: E731
    band = lambda: str(luck.randrange(bands + 1))  # noqa: E731
    element = lambda name, text: f"<{name}>{text}</{name}>"  # noqa: E731
    records = []
    for index in range(bands):
        chosen = luck.sample("MINIMUM MAXIMUM MEAN STANDARDDEVIATION SUM SUM2 RMS NOVELTY".split(), 5)
        records.append("<BANDSTATISTICS>" + element("RSTC_BAND", index) + "\n".join(
            element("RSTC_" + name, number()) for name in chosen) + "</BANDSTATISTICS>")
    for _ in range(luck.randrange(4)):
        counts = "|".join(number() for _ in range(luck.randrange(1, 9)))
        middle = [element("HIST_BAND", luck.randrange(bands)), element("HIST_LEVEL", luck.randrange(3)),
                  element("HIST_SOURCE", "ORVA"), element("HIST_BINSIZE", number()),
                  element("HIST_MIN", number()), element("HIST_MAX", number())]
        luck.shuffle(middle)
        lists = [element("HIST_BINCOUNT", luck.randrange(9)), element("HIST_COUNTS", counts)]
        lists += luck.choice([[], [], [element("HIST_COUNTS", number())], lists[:1], lists])
        luck.shuffle(lists)
        middle[luck.randrange(6):0] = lists
        records.append("<HISTOGRAMS>" + "".join(middle) + "</HISTOGRAMS>")
    for _ in range(luck.randrange(3)):
        colours = ["|".join(number() for _ in range(luck.randrange(1, 6))) for _ in range(luck.randrange(1, 5))]
        middle = [element("PALETTE_RGBA", colour) for colour in colours]
        if luck.random() < 0.8:
            middle.insert(luck.randrange(len(middle)), element("PALETTE_BAND", luck.randrange(bands)))
        records.append(luck.choice(["<PALETTE>{}</PALETTE>", "<X a='1'><PALETTE>{}</PALETTE></X>"]).format(
            "".join(middle)))
    if luck.random() < 0.3:
        records.append(element("RSTC_MEAN", "5") + "<!-- between records -->" + element("NOVELTY", band()))
    text = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<DATASET>" + "\n".join(records) + "</DATASET>\n\n"
    return text.encode()


class ReaderTest(unittest.TestCase):
    def setUp(self):
        gdal.UseExceptions()
        gdal.PushErrorHandler("CPLQuietErrorHandler")
        self.addCleanup(gdal.PopErrorHandler)
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = folder.name
        print(f"ZMC_CAMPAIGN_PHASE={PHASE}", flush=True)

    def path(self, name):
        return os.path.join(self.folder, name)

    def make(self, luck, number):
        """A pyramid of random samples, by the command or by the driver; its name."""
        generator = np.random.default_rng(luck.getrandbits(32))
        kind = list(GDAL_TYPES)[number % 12]
        bands = luck.choice([1, 1, 2, 3, 9])
        width, height = luck.randrange(1, 700), luck.randrange(1, 700)
        memory = gdal.GetDriverByName("MEM").Create("", width, height, bands, GDAL_TYPES[kind])
        pixels = samples(generator, kind, (bands, height, width))
        no_data = luck.choice([None, 3, 4.5 if kind in ("Single", "Double") else 5])
        for index in range(bands):
            band = memory.GetRasterBand(index + 1)
            band.WriteArray(pixels[index].view("u1") if kind == "Char" else pixels[index])
            if no_data is not None:
                band.SetNoDataValue(no_data)
        palette = kind == "Byte" and luck.random() < 0.7
        if palette:
            colours = gdal.ColorTable()
            for entry in range(luck.randrange(1, 256)):
                colours.SetColorEntry(entry, tuple(luck.randrange(256) for _ in range(4)))
            memory.GetRasterBand(1).SetColorTable(colours)
        name, embed = self.path(f"{number}.pyr"), luck.random() < 0.5
        ordering = luck.choice(["auto", "scanline", "blocked"]) if bands < 9 else "auto"
        levels = luck.choice(["auto", "0", "1", "2", "3"])
        while levels.isdigit() and min(width, height) >> int(levels) == 0:
            levels = str(int(levels) - 1)
        if luck.random() < 0.5 and kind != "Char" and (bands == 1 or not palette):
            source = self.path("source.tif")
            gdal.GetDriverByName("GTiff").CreateCopy(source, memory)
            tool("build", "-q", "--overwrite", source, name, "--ordering", ordering, "--levels", levels,
                 *(["--embed"] if embed else []))
        else:
            options = [f"ORDERING={ordering}", f"LEVELS={levels}", f"EMBED={'YES' if embed else 'NO'}"]
            options += ["PIXELTYPE=SIGNEDBYTE"] if kind == "Char" else []
            gdal.GetDriverByName("ZMCPyramid").CreateCopy(name, memory, options=options)
        return name

    def laid_out_anew(self, luck, name):
        """The file with another side of its tiles, ordering, first level, samples of any bits, and records."""
        made = Pyramid(name)
        header, _ = parts(content_of(name))
        side, ordering = luck.choice(SIDES), luck.choice(["Scanline", "Blocked", "Morton"])
        first = luck.choice([0, 0, 0, min(1, made.levels[-1])])
        if made.width * made.height > 4000 * side * side:
            side = 64
        for field, text in (("TILESIZE", str(side)), ("BUILD_METHOD", ordering), ("LEVELMIN", str(first))):
            header = header_field(field, text, header)
        pixels = sum((made.width >> level) * (made.height >> level) for level in range(first, made.levels[-1] + 1))
        noise = np.random.default_rng(luck.getrandbits(32)).integers(
            0, 256, pixels * made.bands * made.sample, "u1").tobytes()
        document = metadata(luck, made.bands, made.type) if luck.random() < 0.7 else made.records.document
        with open(name, "wb") as file:
            file.write(assembled(header, noise + document))

    def agree(self, name, luck):
        """Compares all that the reader tells with what the module tells."""
        pyramid = Pyramid(name)
        told = json.loads(tool("info", "--json", name))
        facts = ["width", "height", "bands", "pixelType", "tileOrdering", "tileSize", "levelMin", "levelMax", "complete"]
        self.assertEqual([told[fact] for fact in facts], [
            pyramid.width, pyramid.height, pyramid.bands, pyramid.type, pyramid.ordering, pyramid.tile,
            pyramid.levels[0], pyramid.levels[-1], pyramid.complete])
        self.records_agree(pyramid.records, told)
        compared = self.pixels_agree(name, pyramid)
        level = luck.choice(pyramid.levels)
        columns, rows = pyramid.size(level)
        if columns and rows and not self.without_place(pyramid, level):
            x, y = luck.randrange(columns), luck.randrange(rows)
            window = (x, y, luck.randint(1, columns - x), luck.randint(1, rows - y))
            bands = luck.sample(range(pyramid.bands), luck.randint(1, pyramid.bands))
            digest = hashlib.sha256(pyramid.read(level, window, bands).transpose(1, 2, 0).tobytes()).hexdigest()
            stated = tool("hash", "--json", name, "--level", str(level), "--window", ",".join(map(str, window)),
                          "--bands", ",".join(str(band + 1) for band in bands))
            self.assertIn(digest, stated)
        return compared

    def without_place(self, pyramid, level):
        """Whether the order Morton gives the level's tiles no place of their size."""
        return pyramid.morton and pyramid.tile % (1 << level) != 0

    def records_agree(self, records, told):
        names = {"minimum": "minimum", "maximum": "maximum", "mean": "mean", "standardDeviation": "standarddeviation",
                 "sum": "sum", "sumOfSquares": "sum2", "rootMeanSquare": "rms"}
        expected = {entry["band"] - 1: {names[key]: value for key, value in entry.items()
                                        if key != "band" and value is not None} for entry in told["statistics"]}
        for band in range(told["bands"]):
            found = records.statistics(band)
            self.assertEqual(set(found), set(expected.get(band, {})), f"band {band}")
            for key, value in found.items():
                self.same_number(value, expected[band][key], f"{key} of band {band}")
        self.assertEqual(len(records.histograms()), len(told["histograms"]))
        for mine, stated in zip(records.histograms(), told["histograms"]):
            self.assertEqual((mine["band"] + 1, mine["level"], mine["bins"]),
                             (stated["band"], stated["level"], stated["binCount"]))
            self.same_number(mine["size"], stated["binSize"], "size of a bin")
            self.same_number(mine["minimum"], stated["minimum"], "minimum")
            self.same_number(mine["maximum"], stated["maximum"], "maximum")
            self.assertEqual(mine["counts"], [int(count) for count in stated["counts"] or []])
        colours = {entry["band"] - 1: [tuple(colour) for colour in entry["colors"]] for entry in told["palettes"]}
        self.assertEqual({band: palette for band, palette in records.palettes().items() if palette}, colours)

    def same_number(self, mine, stated, what):
        if isinstance(mine, np.complexfloating):
            self.assertEqual(float(stated[1]), 0)
            mine, stated = mine.real, stated[0]
        value = type(mine)(stated)
        self.assertTrue(mine == value or (mine != mine and value != value) or
                        abs(mine - value) <= 1e-14 * abs(value), f"{what}: {mine} and {stated}")

    def pixels_agree(self, name, pyramid, window=None):
        """Every sample and mask of every level that the driver shows; how many samples."""
        raster = gdal.OpenEx(name, open_options=["INT8_AS=SIGNEDBYTE", "MISSING=ZEROS"])
        bands = raster.GetRasterBand
        compared = 0
        for level in pyramid.levels[:32]:
            columns, rows = pyramid.size(level)
            if not columns or not rows or self.without_place(pyramid, level):
                continue
            area = (0, 0, min(columns, window or columns), min(rows, window or rows))
            mine = pyramid.read(level, area)
            for index in range(min(pyramid.bands, 12)):
                band = bands(index + 1)
                shown = [band, *(band.GetOverview(i) for i in range(band.GetOverviewCount()))]
                band = next((one for one in shown if (one.XSize, one.YSize) == (columns, rows)), None)
                if band is None:
                    continue
                theirs = band.ReadAsArray(*area)
                self.assertEqual(mine[index].tobytes(), theirs.astype(theirs.dtype.newbyteorder("<")).tobytes(),
                                 f"level {level}, band {index}")
                if pyramid.records.no_data(index) is not None:
                    seen = band.GetMaskBand().ReadAsArray(*area)
                    np.testing.assert_array_equal(pyramid.records.mask(mine[index], index), seen == 0)
                compared += mine[index].size
        return compared

    def test_reader_agrees_with_the_module(self):
        started, compared = time.time(), 0
        for number in range(FILES):
            luck = random.Random(f"reader {PHASE} {number}")
            with self.subTest(number=number):
                name = self.make(luck, number)
                compared += self.agree(name, luck)
                if number % 2:
                    self.laid_out_anew(luck, name)
                    compared += self.agree(name, luck)
        self.assertGreater(compared, FILES * 10000)
        print(f"{FILES} files, {FILES // 2} of them laid out anew as well: {compared} samples, "
              f"{time.time() - started:.1f} s", flush=True)

    def damage(self, luck, content):
        header, rest = parts(content)
        what = luck.choice(["flip", "flip header", "flip metadata", "cut", "number", "number", "word"])
        if what == "number":
            for _ in range(luck.randint(1, 3)):
                header = header_field(luck.choice(NUMERIC), luck.choice(HEADER_NUMBERS), header)
            return assembled(header, rest)
        if what == "word":
            field = luck.choice(list(WORDS))
            return assembled(header_field(field, luck.choice(WORDS[field]), header), rest)
        if what == "cut":
            return content[: luck.choice([luck.randrange(len(content)), luck.randrange(20 + len(header))])]
        start, end = {"flip": (0, len(content)), "flip header": (0, 20 + len(header)),
                      "flip metadata": (max(content.rfind(b"<?xml"), 0), len(content))}[what]
        content = bytearray(content)
        for _ in range(luck.randint(1, 3)):
            content[luck.randrange(start, end)] ^= 1 << luck.randrange(8)
        return bytes(content)

    def test_damage_ends_in_an_error_or_the_same_answer(self):
        ends, slowest = dict.fromkeys(["same answer", "both refuse", "reader refuses", "module refuses"], 0), 0.0
        sources = []
        for number in range(24):
            luck = random.Random(f"sources {PHASE} {number}")
            name = self.make(luck, number)
            if number % 2:
                self.laid_out_anew(luck, name)
            sources.append(content_of(name))
        name = self.path("damaged.pyr")
        for number in range(DAMAGED):
            luck = random.Random(f"damage {PHASE} {number}")
            with open(name, "wb") as file:
                file.write(self.damage(luck, luck.choice(sources)))
            with self.subTest(number=number):
                started = time.process_time()
                try:
                    pyramid = Pyramid(name)
                    levels = [level for level in pyramid.levels[:32] if min(pyramid.size(level)) > 0]
                    for level in levels:
                        pyramid.read(level, (0, 0, *(min(side, 300) for side in pyramid.size(level))))
                    mine = True
                except ValueError as error:
                    self.assertNotIn("\n", str(error))
                    mine = False
                slowest = max(slowest, time.process_time() - started)
                try:
                    raster = gdal.OpenEx(name, open_options=["MISSING=ZEROS"])
                    raster.GetRasterBand(1).ReadAsArray(0, 0, 1, 1)
                    theirs = True
                except RuntimeError:
                    theirs = False
                ends[{(True, True): "same answer", (False, False): "both refuse", (False, True): "reader refuses",
                      (True, False): "module refuses"}[mine, theirs]] += 1
                if mine and theirs:
                    self.pixels_agree(name, pyramid, 300)
                    raster = gdal.OpenEx(name)
                    for index in range(min(raster.RasterCount, 12)):
                        theirs = raster.GetRasterBand(index + 1).GetMetadataItem("STATISTICS_MEAN")
                        known = pyramid.records.statistics(index).get("mean")
                        if theirs is not None and known is not None:
                            self.same_number(known, theirs, f"mean of band {index}")
        peak = resource.getrusage(resource.RUSAGE_SELF).ru_maxrss >> 10
        self.assertLess(slowest, 20)
        self.assertLess(peak, 3072)
        self.assertGreater(ends["same answer"], DAMAGED // 10)
        print(f"{DAMAGED} damaged files: {ends}; slowest {slowest:.2f} s, peak {peak} MiB", flush=True)

    def test_command_line(self):
        name, luck = self.make(random.Random("command"), 0), random.Random("window")
        pyramid = Pyramid(name)
        x, y = luck.randrange(pyramid.width), luck.randrange(pyramid.height)
        window = (x, y, pyramid.width - x, pyramid.height - y)
        out = self.path("out.npy")
        run = lambda *arguments: subprocess.run(  # noqa: E731
            [sys.executable, "-B", READER, *arguments], capture_output=True, text=True, timeout=60)
        done = run(name, "--window", ",".join(map(str, window)), "--out", out)
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        self.assertIn(f"{pyramid.width} x {pyramid.height} pixels", done.stdout)
        np.testing.assert_array_equal(np.load(out), pyramid.read(0, window))
        for wrong in ([self.path("none.pyr")], [READER], [name, "--level", "77"], [name, "--window", "0,0,9999,1"]):
            done = run(*wrong)
            self.assertEqual((done.returncode, done.stderr.count("\n")), (1, 1), done.stderr)


if __name__ == "__main__":
    unittest.main()
