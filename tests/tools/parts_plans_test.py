"""Plans that fit no more what they were made for, and files that are no plans."""
import itertools
import json
import os
import shutil

from parts import FULL, PLAN, PartsTest, drawn


class Stale(PartsTest):
    def setUp(self):
        super().setUp()
        self.source()
        self.plan()
        self.good("part", PLAN, "0-4")

    def check_refused(self, message):
        for words in (("part", PLAN, "5"), ("finish", PLAN)):
            self.refused(1, message, *words)
        self.assertNotIn("made.pyr", self.files())

    def test_a_source_that_was_written_to_is_seen(self):
        state = os.stat(self.path("source.tif"))
        self.source(height=700)
        self.check_refused(self.path("source.tif") + ": it changed since the plan was made")
        os.utime(self.path("source.tif"), ns=(state.st_atime_ns, state.st_mtime_ns))
        self.assertEqual(self.status()["done"], 5)

    def test_a_source_of_another_shape_is_seen(self):
        state = os.stat(self.path("source.tif"))
        self.source("Int32")
        os.utime(self.path("source.tif"), ns=(state.st_atime_ns, state.st_mtime_ns))
        done = self.run_tool("part", PLAN, "5")
        self.assertEqual((done.returncode, done.stdout, done.stderr.count("\n")), (1, "", 1))

    def test_a_source_that_is_gone_is_told(self):
        os.remove(self.path("source.tif"))
        self.check_refused(self.path("source.tif") + ": there is no such file")

    def test_a_file_that_is_gone_or_another_is_told(self):
        pyramid = self.pyramid_path()
        shutil.copy(pyramid, self.path("copy"))
        os.remove(pyramid)
        message = f"{PLAN}: the file that was laid out for it is gone, or another one"
        self.check_refused(message)
        os.rename(self.path("copy"), pyramid)
        self.check_refused(message)
        self.refused(1, message, "status", PLAN)

    def test_tiles_that_are_not_what_a_part_wrote_are_seen(self):
        self.good("part", PLAN, "5")
        with open(self.pyramid_path(), "r+b") as file:
            size = os.path.getsize(self.pyramid_path())
            # Level 0 stands last; of the levels that finish reads, the parts' own is before it.
            file.seek(size - 700 * 1100 * 4 - 1000)
            file.write(b"x" * 100)
        done = self.run_tool("finish", PLAN)
        self.assertEqual((done.returncode, done.stdout), (1, ""))
        self.assertRegex(done.stderr, rf"^zmcraster: {PLAN}: 1 of 6 parts are missing: \d\n$")
        part = done.stderr.split()[-1]
        expected = self.expected()
        self.good("part", PLAN, part)
        self.good("finish", PLAN)
        self.assertFinished(expected)

    def test_records_that_are_damaged_or_gone_are_missing(self):
        folder = self.pyramid_path() + ".parts"
        os.remove(folder + "/1.part")
        os.truncate(folder + "/2.part", 20)
        shutil.copy(folder + "/3.part", folder + "/4.part")
        self.refused(1, f"{PLAN}: 4 of 6 parts are missing: 1-2, 4-5", "finish", PLAN)
        self.assertEqual(self.status()["missing"], [1, 2, 4, 5])
        expected = self.expected()
        self.good("part", PLAN, "1-5")
        self.good("finish", PLAN)
        self.assertFinished(expected)


class BadPlans(PartsTest):
    COMMANDS = (("status", PLAN), ("part", PLAN, "0"), ("finish", PLAN), ("finish", PLAN, "--discard"))

    def setUp(self):
        super().setUp()
        self.turns = itertools.cycle(self.COMMANDS)

    def refuse(self, message):
        """By one of the commands that read a plan, each time the next; all read it in one way."""
        for words in self.COMMANDS if FULL else (next(self.turns),):
            self.refused(1, message, *words)

    def write(self, text):
        with open(self.path(PLAN), "wb" if isinstance(text, bytes) else "w") as file:
            file.write(text)

    def changed(self, **members):
        """The plan with other members and a checksum that fits."""
        with open(self.path(PLAN)) as file:
            document = json.load(file)
        document.update(members)
        del document["checksum"]
        text = json.dumps(document, separators=(",", ":"), ensure_ascii=False)
        total = 0xCBF29CE484222325
        for byte in text.encode():
            total = (total ^ byte) * 0x100000001B3 & 0xFFFFFFFFFFFFFFFF
        document["checksum"] = f"{total:016x}"
        self.write(json.dumps(document))

    def test_what_is_no_plan(self):
        for _ in self.COMMANDS:
            self.refuse(f"{PLAN}: it cannot be read: No such file or directory")
        for text in ("", "x", "{", "[]", "{}", "\0" * 100, b"\xff\xfe", "[" * 500000,
                     '{"a":' * 150000):
            with self.subTest(text[:10]):
                self.write(text)
                self.refuse(f"{PLAN}: it is no plan of a build")
        for text in ('{"zmcrasterPlan": 1}', '{"zmcrasterPlan": 1, "source": 7}'):
            self.write(text)
            self.refuse(f"{PLAN}: it is no plan of a build, or a damaged one")
        self.write('{"zmcrasterPlan": 2}')
        self.refuse(f"{PLAN}: it is a plan of version 2, and this program knows version 1")
        os.truncate(self.path(PLAN), 1 << 40)
        self.refuse(f"{PLAN}: it is too large for a plan")
        os.remove(self.path(PLAN))
        os.mkfifo(self.path(PLAN))
        self.refuse(f"{PLAN}: it is not a regular file")

    def test_a_plan_with_something_deep_in_it(self):
        self.source()
        self.plan()
        plan = self.content(PLAN).decode().rstrip().removesuffix("}")
        for opening, closing in (("[", "]"), ('{"a":', "}")):
            with self.subTest(opening):
                deep = opening * 100000 + "1" + closing * 100000
                self.write(f'{plan}, "deep": {deep}}}')
                self.refuse(f"{PLAN}: it is no plan of a build")

    def test_a_plan_that_was_changed_by_hand(self):
        self.source()
        self.plan()
        before = self.content(PLAN)
        for old, new in ((b'"resampling": ""', b'"resampling": "mode"'),
                         (b'"partRows": 1', b'"partRows": 2'), (b'"durable": true',
                                                                b'"durable": false')):
            self.assertIn(old, before)
            self.write(before.replace(old, new))
            done = self.run_tool("finish", PLAN)
            self.assertEqual(done.returncode, 1)
            self.assertIn(done.stderr, (f"zmcraster: {PLAN}: it was changed since it was made\n",
                                        f"zmcraster: {PLAN}: its parts cannot be\n"))
        # Other white space is no change.
        self.write(json.dumps(json.loads(before)))
        self.good("part", PLAN, "0-5")
        expected = self.expected()
        self.good("finish", PLAN)
        self.assertFinished(expected)

    def test_one_that_was_changed_with_its_checksum_has_no_records(self):
        self.source()
        self.plan()
        self.good("part", PLAN, "0-5")
        with open(self.path(PLAN)) as file:
            options = json.load(file)["options"]
        self.changed(options={**options, "bins": "9"})
        done = self.run_tool("part", PLAN, "0")
        self.assertEqual(done.stderr, f"zmcraster: {self.path('source.tif')}: it is not what the "
                                      "plan was made for\n")
        self.assertEqual(self.status()["done"], 0)

    def test_names_outside_of_the_folder(self):
        self.source()
        self.plan()
        for member in ("target", "pyramid"):
            for name in ("../made.pyr", *drawn(("/etc/passwd", "..", ".", "", "a/b", "a\0b"), 3)):
                with self.subTest((member, name)):
                    self.changed(**{member: name})
                    self.refuse(f"{PLAN}: it names a file outside its folder")
            self.changed(**{member: "x.pyr"})
        self.changed(source="zmc-lent:0123456789abcdef0123456789abcdef")
        self.refuse(f"{PLAN}: names of lent sources are not taken here")

    def test_sizes_that_cannot_be(self):
        self.source()
        self.plan()
        before = self.content(PLAN)
        for member, values in (("width", (0, -1, 1 << 32, "7", 1.5, None)),
                               ("partLevel", (32, 20, -1)), ("partColumns", (0, 1 << 24)),
                               ("partRows", (0, 1 << 40)), ("parts", (5, 7, 1 << 63, -1))):
            for value in drawn(values, 2):
                with self.subTest((member, value)):
                    self.write(before)
                    self.changed(**{member: value})
                    done = self.run_tool("part", PLAN, "0")
                    self.assertEqual((done.returncode, done.stdout), (1, ""))
                    self.assertRegex(done.stderr, rf"^zmcraster: {PLAN}: its \w+ cannot be\n$")

    def test_parts_that_there_are_not(self):
        self.source()
        self.plan()
        there = "there is no part {}; the plan has 6, counted from 0"
        self.refused(2, "K: " + there.format(6), "part", PLAN, "6")
        self.refused(2, "K: " + there.format(9), "part", PLAN, "3-9")
        self.refused(2, "K: 3-1 names no part", "part", PLAN, "3-1")
        self.refused(2, "K: name the parts to make", "part", PLAN)
        self.refused(2, "K: --queue takes the numbers from standard input", "part", PLAN, "1",
                     "--queue")
        for word in ("x", "1x", "", "1-", "-1", "99999999999999999999"):
            done = self.run_tool("part", PLAN, "--", word)
            self.assertEqual((done.returncode, done.stdout, done.stderr.count("\n")), (2, "", 1))
        self.assertEqual(self.status()["done"], 0)

    def test_options_that_do_not_fit_make_no_plan(self):
        self.source()
        before = self.files()
        for words in drawn((("--part-size", "0"), ("--part-size", "axb"), ("--part-size", "5x"),
                            ("--bands", "7"), ("--nodata", "x"), ("--levels", "99"),
                            ("--memory", "1K")), 4):
            done = self.run_tool("plan", "source.tif", "made.pyr", *words)
            self.assertIn(done.returncode, (1, 2), words)
            self.assertEqual((done.stdout, done.stderr.count("\n")), ("", 1), words)
            self.assertEqual(self.files(), before, words)
        self.refused(1, "source.tif: it is the source; name another file", "plan", "source.tif",
                     "source.tif")
