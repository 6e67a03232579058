"""What hostile files may cost: files of which something once took minutes or gigabytes, each by name,
and some generated ones. What is judged, and how, tells attack.py."""
import os
import queue
import random
import resource
import subprocess
import tempfile
import unittest

import attack
import hostile

ASKS_AFTER = 0.5  # seconds of processor time of a command that goes through a large file
DRIVER = not attack.SANITIZED


def many(count):
    """So many; with sanitizers, which make all of it slow and whose costs are not judged, a tenth."""
    return count // 10 if attack.SANITIZED else count


GENERATED_FILES = 4 if attack.SANITIZED else 6


def plain(**fields):
    """A draft of one small band, with what is told changed."""
    draft = hostile.Draft(random.Random(1))
    draft.fields.update(BANDS="1", PIXEL_HEIGHT="30", PIXEL_WIDTH="40", LEVELMIN="0", LEVELMAX="0",
                        TILESIZE="256", BUILD_METHOD="Blocked", PIXEL_TYPE="Byte")
    draft.fields.update({name: str(value) for name, value in fields.items()})
    draft.records = []
    return draft


class AttackTest(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.scratch = tempfile.TemporaryDirectory(prefix="zmcattack")
        cls.addClassCleanup(cls.scratch.cleanup)
        cls.attacker = attack.Attacker(cls.scratch.name, ASKS_AFTER)
        cls.file = os.path.join(cls.scratch.name, "x.pyr")

    def assertHarmless(self, draft):
        self.assertEqual(self.attacker.judge_draft(draft, self.file), [])

    def run_tool(self, *arguments, **more):
        return subprocess.run([attack.TOOL, *arguments], capture_output=True, text=True, timeout=300,
                              cwd=self.scratch.name, stdin=subprocess.DEVNULL, check=False, **more)


def throws(name):
    """Stands for a run of the driver."""
    raise RuntimeError(f"processor time ends at {resource.getrlimit(resource.RLIMIT_CPU)[0]} s")


class Judgement(AttackTest):
    def findings(self, name, cost):
        return list(self.attacker.judge(name, cost, 0, 0, 1))

    def cost_of(self, name, status, message="", hung=False, asked=False):
        base = self.attacker.base[name]
        return attack.Cost(base.seconds, base.memory, status, message, hung, asked)

    @unittest.skipUnless(DRIVER, "the driver cannot be loaded here")
    def test_what_a_run_of_the_driver_throws_is_a_finding(self):
        cost = self.attacker.runner.run(attack.run_driver, throws, self.file, self.scratch.name)
        found = self.findings("gdal-read", cost)
        self.assertEqual(found[0], "ends with status 1")
        self.assertIn(f"RuntimeError: processor time ends at {2 * attack.PATIENCE} s", found[1])

    def test_a_command_that_was_asked_to_end_is_judged_too(self):
        self.assertEqual(self.findings("hash", self.cost_of("hash", 130, asked=True)), [])
        self.assertEqual(self.findings("hash", self.cost_of("hash", 130)), ["ends with status 130"])
        self.assertEqual(self.findings("hash", self.cost_of("hash", -11, asked=True)),
                         ["is killed by signal 11"])
        hung = self.cost_of("hash", -9, hung=True, asked=True)
        self.assertIn("does not end within", self.findings("hash", hung)[0])
        if not attack.SANITIZED:
            large = self.cost_of("hash", 130, asked=True)
            large.memory += 100 << 20
            self.assertEqual(self.findings("hash", large), ["takes 100 MiB"])

    def test_a_worker_that_stops_ends_the_attack(self):
        class Stopped:
            exitcode = 1
        results = queue.Queue()
        results.put(["found"])
        self.assertEqual(attack.next_findings(results, [Stopped]), ["found"])
        with self.assertRaises(queue.Empty):
            attack.next_findings(results, [Stopped])


class KnownFiles(AttackTest):
    def test_no_width_and_thousands_of_millions_of_bands(self):
        draft = plain(BANDS=2**32 - 1, PIXEL_WIDTH=0)
        self.assertHarmless(draft)
        draft.save(self.file)
        for command in ("info", "verify", "hash"):
            self.assertEqual(
                self.run_tool(command, "x.pyr").stderr,
                "zmcraster: x.pyr: cannot read the header: it has 4294967295 bands, beyond the limit "
                "of 65536; ZMC_LIMITS=bands=4294967295 raises it\n")

    def test_no_width_and_as_many_bands_as_are_taken_on(self):
        self.assertHarmless(plain(BANDS=65536, PIXEL_WIDTH=0))

    def test_many_bands_and_levels(self):
        self.assertHarmless(plain(BANDS=many(65536), PIXEL_HEIGHT=1, PIXEL_WIDTH=1, LEVELMAX=1023,
                                  BUILD_METHOD="Morton"))

    def test_levels_with_all_bands_of_a_wide_raster(self):
        draft = plain(BANDS=65536, PIXEL_HEIGHT=1, PIXEL_WIDTH=2**31 - 1, LEVELMAX=31,
                      TILESIZE=2048, BUILD_METHOD="Morton")
        draft.body = b"1" * 1000
        draft.sparse = 1 << 42
        self.assertHarmless(draft)

    def test_a_tile_table_of_gigabytes(self):
        for width, height, tile in ((65536, 8192, 1), (20000, 20000, 2), (65536, 65536, 8)):
            with self.subTest(width=width):
                draft = plain(PIXEL_WIDTH=width, PIXEL_HEIGHT=height, TILESIZE=tile, LEVELMAX=2,
                              BUILD_METHOD="Morton", BANDS=1)
                draft.body = b"1"
                self.assertHarmless(draft)
                draft.sparse = 1 << 40
                self.assertHarmless(draft)

    def test_a_line_of_gigabytes(self):
        draft = plain(PIXEL_WIDTH=2**31 - 1, PIXEL_HEIGHT=1, BANDS=8, PIXEL_TYPE="ComplexDouble")
        draft.body = b"1"
        self.assertHarmless(draft)
        draft.sparse = 1 << 40
        self.assertHarmless(draft)

    def test_tiles_of_gigabytes(self):
        draft = plain(PIXEL_WIDTH=2048, PIXEL_HEIGHT=2048, TILESIZE=2048, BANDS=34,
                      PIXEL_TYPE="Double")
        draft.body = b"1"
        self.assertHarmless(draft)
        draft.sparse = 1 << 33
        self.assertHarmless(draft)

    def test_statistics_of_a_thousand_bands(self):
        draft = plain(BANDS=1000, BUILD_METHOD="Morton", PIXEL_WIDTH=1, PIXEL_HEIGHT=1)
        draft.records = [draft.statistics(band) for band in range(many(1000))]
        self.assertHarmless(draft)

    def test_statistics_of_reals_of_all_bands_there_may_be(self):
        draft = plain(BANDS=many(65536), BUILD_METHOD="Morton", PIXEL_WIDTH=1, PIXEL_HEIGHT=1,
                      PIXEL_TYPE="Double")
        draft.records = [draft.statistics(band) for band in range(many(1000))]
        self.assertHarmless(draft)

    def test_more_elements_than_a_store_takes_on(self):
        draft = plain()
        draft.records = [draft.statistics(band % 50) for band in range(many(20000))]
        self.assertHarmless(draft)

    def test_millions_of_attributes(self):
        text = "<a " + " ".join(f"b{i}='1'" for i in range(many(2000000))) + "/>"
        for place in ("behind", "records"):
            with self.subTest(place):
                draft = plain()
                if place == "behind":
                    draft.behind = text
                else:
                    draft.records = [text]
                self.assertHarmless(draft)

    def test_attributes_that_an_encoding_hides(self):
        text = "<a " + " ".join(f"b{i}+AD0'1'" for i in range(many(1000000))) + "/>"
        draft = plain()
        draft.document = '<?xml version="1.0" encoding="UTF-7"?>' + text
        self.assertHarmless(draft)

    def test_palettes_within_palettes(self):
        """Each has the colours of all inside it."""
        colors = "<PALETTE_RGBA>1|2|3|4</PALETTE_RGBA>" * many(100000)
        ends = (f"<PALETTE_BAND>{band}</PALETTE_BAND></PALETTE>" for band in range(60))
        text = "<PALETTE>" * 60 + colors + "".join(ends)
        for place in ("behind", "records"):
            with self.subTest(place):
                draft = plain(BANDS=60)
                if place == "behind":
                    draft.behind = text
                else:
                    draft.records = [text]
                self.assertHarmless(draft)

    def test_a_histogram_of_a_million_bins(self):
        draft = plain()
        draft.records = [hostile.element("HISTOGRAMS", "".join((
            hostile.element("HIST_BAND", 0), hostile.element("HIST_LEVEL", 0),
            hostile.element("HIST_BINCOUNT", many(1 << 20)), hostile.element("HIST_BINSIZE", 1),
            hostile.element("HIST_MIN", 0), hostile.element("HIST_MAX", 1),
            hostile.element("HIST_COUNTS", "|".join("0" * many(1 << 20))))))]
        self.assertHarmless(draft)

    def test_a_document_that_is_a_hole(self):
        for start in (b"", b"<DATASET>"):
            with self.subTest(start):
                draft = plain()
                draft.document = start.decode()
                draft.sparse = many(250 << 20)
                self.assertHarmless(draft)

    def test_a_header_that_is_a_hole(self):
        draft = plain()
        draft.start_shift = many(250 << 20)
        draft.sparse = draft.start_shift + (1 << 20)
        self.assertHarmless(draft)

    def test_a_store_that_never_ended(self):
        draft = plain(BANDS=many(65536), BUILD_METHOD="Morton", PIXEL_WIDTH=1, PIXEL_HEIGHT=1)
        records = "".join(draft.statistics(band) for band in range(many(2000)))
        draft.document = "\x1a" + records
        self.assertHarmless(draft)


@unittest.skipIf(attack.SANITIZED, "what commands with sanitizers cost is not judged")
class Verification(AttackTest):
    """Goes through all that a complete file claims, holes included, a part at a time."""

    PARTS = 400 << 20  # bytes, of what is held at once

    def memory(self, *arguments, status=0):
        """Bytes beyond those that a small good file takes."""
        cost = self.attacker.runner.run(attack.run_tool, ["verify", *arguments],
                                        self.attacker.folder)
        self.assertEqual((cost.status, cost.hung, cost.message), (status, False, ""))
        return cost.memory - self.attacker.base["verify"].memory

    def complete(self, draft, body=b""):
        """Saves a file whose tiles are those bytes and a hole; its records stand behind that."""
        records, draft.records, draft.body = draft.records, [], body
        draft.save(self.file)
        with open(self.file, "r+b") as file:
            end = file.seek(0, os.SEEK_END) - len(body) + draft.tile_bytes()
            file.truncate(end)
            if records:
                file.seek(end)
                file.write(f"<DATASET>{''.join(records)}</DATASET>".encode())

    def test_levels_with_large_tiles_of_many_bands(self):
        self.complete(plain(PIXEL_WIDTH=2048, PIXEL_HEIGHT=2048, TILESIZE=2048, BANDS=24,
                            LEVELMAX=1, PIXEL_TYPE="Double"))
        self.assertLess(self.memory("x.pyr"), self.PARTS)

    def test_statistics_of_a_long_line(self):
        draft = plain(PIXEL_WIDTH=10**8, PIXEL_HEIGHT=1, PIXEL_TYPE="Double")
        draft.records = [draft.statistics(0)]
        self.complete(draft)
        self.assertLess(self.memory("x.pyr", status=3), self.PARTS)

    def test_a_histogram_of_a_long_line(self):
        draft = plain(PIXEL_WIDTH=10**8, PIXEL_HEIGHT=1, PIXEL_TYPE="UInt32")
        draft.records = [self.histogram(0, 10**8)]
        self.complete(draft)
        self.assertLess(self.memory("x.pyr"), self.PARTS)

    def test_a_long_line_that_differs_from_its_source(self):
        other = plain(PIXEL_WIDTH=10**8, PIXEL_HEIGHT=1)
        self.complete(other)
        os.rename(self.file, os.path.join(self.scratch.name, "zeros.pyr"))
        self.complete(other, b"1")
        self.assertLess(self.memory("x.pyr", "--against", "zeros.pyr", status=3), self.PARTS)

    def test_histograms_take_the_bands_that_have_one(self):
        draft = plain(PIXEL_WIDTH=64, PIXEL_HEIGHT=64, TILESIZE=64, BANDS=60000,
                      BUILD_METHOD="Morton")
        draft.records = [self.histogram(59998, 64 * 64)]
        self.complete(draft)
        self.assertLess(self.memory("x.pyr"), 32 << 20)

    def test_histograms_of_more_bands_than_are_counted_at_once(self):
        draft = plain(PIXEL_WIDTH=64, PIXEL_HEIGHT=64, TILESIZE=64, BANDS=400,
                      BUILD_METHOD="Morton")
        draft.records = [self.histogram(band, 64 * 64)
                         for band in [*range(399, 99, -1), 250, 250]]
        draft.records.append(self.histogram(399, 7))
        self.complete(draft)
        self.memory("x.pyr", status=3)
        with open(os.path.join(self.attacker.folder, "stdout")) as output:
            told = [line for line in output.read().splitlines() if line.startswith("  ")]
        self.assertEqual(told, ["  band 400: 1 bins of the histogram differ from the pixels"])

    @staticmethod
    def histogram(band, zeros):
        """Two bins, of the values 0 and 1; the second has counted nothing."""
        return hostile.element("HISTOGRAMS", "".join((
            hostile.element("HIST_BAND", band), hostile.element("HIST_LEVEL", 0),
            hostile.element("HIST_BINCOUNT", 2), hostile.element("HIST_BINSIZE", 1),
            hostile.element("HIST_MIN", 0), hostile.element("HIST_MAX", 1),
            hostile.element("HIST_COUNTS", f"{zeros}|0"))))


class HonestFiles(AttackTest):
    """Limits are for claims: what is large and there is let through."""

    def opens(self, draft, bands):
        draft.save(self.file)
        done = self.run_tool("info", "x.pyr")
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        if not DRIVER:
            return None
        from osgeo import gdal
        dataset = gdal.OpenEx(self.file, gdal.OF_RASTER, allowed_drivers=["ZMCPyramid"])
        self.assertEqual(dataset.RasterCount, bands)
        self.assertIsNotNone(dataset.GetRasterBand(bands).ReadRaster(0, 0, 1, 1))
        return dataset

    def test_many_bands_of_a_small_raster(self):
        bands = many(65536)
        draft = plain(BANDS=bands, BUILD_METHOD="Morton", PIXEL_WIDTH=4, PIXEL_HEIGHT=4, LEVELMAX=2)
        draft.body = b"1" * draft.tile_bytes()
        dataset = self.opens(draft, bands)
        if dataset:
            overview = dataset.GetRasterBand(bands).GetOverview(0)
            self.assertEqual((overview.XSize, overview.YSize), (2, 2))
            self.assertIsNotNone(overview.ReadRaster(0, 0, 2, 2))
            self.assertEqual(len(dataset.ReadRaster(0, 0, 4, 4, 2, 2)), 4 * bands)

    def test_a_raster_of_the_whole_earth(self):
        for ordering in ("Blocked", "Scanline"):
            with self.subTest(ordering):
                draft = plain(BANDS=8, BUILD_METHOD=ordering, PIXEL_WIDTH=1296000,
                              PIXEL_HEIGHT=525000, LEVELMAX=8)
                draft.body = b"1" * 1000
                draft.sparse = draft.tile_bytes() - 1000
                self.opens(draft, 8)

    def test_a_palette_of_16_bits(self):
        draft = plain(PIXEL_TYPE="UInt16")
        draft.records = [hostile.element("PALETTE", hostile.element("PALETTE_BAND", 0) +
                                         hostile.element("PALETTE_RGBA", "1|2|3|4") * 65536)]
        dataset = self.opens(draft, 1)
        if dataset:
            self.assertEqual(dataset.GetRasterBand(1).GetColorTable().GetCount(), 65536)

    def test_histograms_of_65536_bins_for_200_bands(self):
        counts = "|".join(["7"] * 65536)
        draft = plain(BANDS=200, BUILD_METHOD="Morton", PIXEL_TYPE="UInt16")
        draft.records = [hostile.element("HISTOGRAMS", "".join((
            hostile.element("HIST_BAND", band), hostile.element("HIST_LEVEL", 0),
            hostile.element("HIST_BINCOUNT", 65536), hostile.element("HIST_BINSIZE", 1),
            hostile.element("HIST_MIN", 0), hostile.element("HIST_MAX", 65535),
            hostile.element("HIST_COUNTS", counts)))) for band in range(200)]
        dataset = self.opens(draft, 200)
        if dataset:
            self.assertEqual(dataset.GetRasterBand(200).GetDefaultHistogram(force=0)[3], [7] * 65536)


class Limits(AttackTest):
    def test_the_environment_and_the_command_line_change_them(self):
        plain(BANDS=70000, BUILD_METHOD="Morton", PIXEL_WIDTH=1, PIXEL_HEIGHT=1).save(self.file)
        self.assertEqual(self.run_tool("info", "x.pyr").returncode, 1)
        raised = dict(os.environ, ZMC_LIMITS="bands=70000")
        self.assertEqual(self.run_tool("info", "x.pyr", env=raised).returncode, 0)
        self.assertEqual(self.run_tool("--limit", "bands=70K", "info", "x.pyr").returncode, 0)
        self.assertEqual(
            self.run_tool("--limit", "document=1,bands=9", "info", "x.pyr", env=raised).stderr,
            "zmcraster: x.pyr: cannot read the header: it has 70000 bands, beyond the limit of 9; "
            "ZMC_LIMITS=bands=70000 raises it\n")

    def test_each_is_told_with_its_name(self):
        draft = plain()
        draft.records = [draft.statistics(0)]
        draft.save(self.file)
        size = len("".join(draft.records)) + len(hostile.DECLARATION) + len("<DATASET></DATASET>")
        self.assertIn(f"has {size} bytes, beyond the limit of 10; ZMC_LIMITS=document={size} raises",
                      self.run_tool("--limit", "document=10", "info", "x.pyr").stderr)
        self.assertRegex(self.run_tool("--limit", "header=10", "info", "x.pyr").stderr,
                         r"^zmcraster: x\.pyr: cannot read the header: its header has (\d+) bytes, "
                         r"beyond the limit of 10; ZMC_LIMITS=header=\1 raises it\n$")

    @unittest.skipUnless(DRIVER, "the driver cannot be loaded here")
    def test_the_driver_tells_those_of_what_it_stores(self):
        from osgeo import gdal
        gdal.UseExceptions()
        self.addCleanup(gdal.DontUseExceptions)
        draft = plain(PIXEL_WIDTH=2048, PIXEL_HEIGHT=2048, TILESIZE=2048, BANDS=5)
        draft.body = b"\0" * (2048 * 2048 * 5)
        draft.records = [draft.statistics(band % 5) for band in range(20000)]
        draft.save(self.file)
        dataset = gdal.OpenEx(self.file, gdal.OF_RASTER | gdal.OF_UPDATE)
        messages = []
        gdal.PushErrorHandler(lambda kind, number, text: messages.append(text))
        self.addCleanup(gdal.PopErrorHandler)
        band = dataset.GetRasterBand(1)
        for store in (lambda: band.SetStatistics(0, 1, 2, 3),
                      lambda: (band.WriteRaster(0, 0, 1, 1, b"1"), dataset.FlushCache())):
            try:
                store()
            except RuntimeError as error:
                messages.append(str(error))
        told = "\n".join(messages)
        self.assertIn("it has 140001 elements, beyond the limit of 131072; "
                      "ZMC_LIMITS=elements=140001 raises it", told)
        self.assertIn("its tiles have 20971520 bytes, beyond the limit of 16777216; "
                      "ZMC_LIMITS=tile=20971520 raises it", told)

    def test_what_is_no_limit_is_refused(self):
        plain().save(self.file)
        for text in ("bands", "bands=", "bands=-1", "bands=1x", "nonesuch=1", "bands=1;tile=2",
                     "bands=99999999999999999999", "tile=99999999999999G"):
            with self.subTest(text):
                done = self.run_tool("--limit", text, "info", "x.pyr")
                self.assertEqual(
                    (done.returncode, done.stderr),
                    (2, f"zmcraster: --limit: {text}: cannot take it for limits: it is no list such "
                        "as bands=100000,tile=1G,document=64M\n"))
                done = self.run_tool("info", "x.pyr", env=dict(os.environ, ZMC_LIMITS=text))
                self.assertEqual((done.returncode, done.stderr.count("\n")), (1, 1), done.stderr)


class GeneratedFiles(AttackTest):
    def test_the_first_of_them_are_harmless(self):
        for seed in range(GENERATED_FILES):
            with self.subTest(seed=seed):
                self.assertEqual(self.attacker.attack(seed), [])


if __name__ == "__main__":
    unittest.main()
