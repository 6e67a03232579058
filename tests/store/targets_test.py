"""Pyramids that are built in parts into object stores, held byte for byte against those of build, and stores that
misbehave."""
import os
import random
import signal
import subprocess
import time
import unittest
import unittest.mock

from osgeo import gdal, osr

from frame import TOOL, TYPES
from parts import PHASE, PartsTest, drawn
from stores import NpmStore, OwnStore, error

TARGET = "s3://maps/deep folder/made+1.pyr"
PLAN = "made+1.pyr.zmcplan"
# So small that files of tests have many.
RANGES = ("--upload-part", "64K")


class StoreTest(PartsTest):
    store_kind = OwnStore

    def setUp(self):
        super().setUp()
        self.store = self.store_kind()
        self.addCleanup(self.store.close)
        self.environment(**self.store.settings())

    def environment(self, **settings):
        patch = unittest.mock.patch.dict(os.environ, settings)
        patch.start()
        self.addCleanup(patch.stop)

    def plan_store(self, *options, size="512"):
        return self.document("plan", "source.tif", TARGET, "--part-size", size, *RANGES, *options)["parts"]

    def make(self, *options, size="512"):
        self.good("part", PLAN, f"0-{self.plan_store(*options, size=size) - 1}")
        return self.good("finish", PLAN)

    def stored(self, ending=""):
        found = self.store.objects.get("/maps/deep folder/made+1.pyr" + ending)
        return found and found[0]

    def assertStored(self, expected):
        self.assertTrue(self.stored() == expected[0], "the bytes are others")
        self.assertEqual(self.stored(".aux.xml"), expected[1])
        self.assertEqual(self.hidden(), [])
        self.assertNotIn(PLAN, self.files())


class FromNpm(StoreTest):
    store_kind = NpmStore

    def stored(self, ending=""):
        name = "/vsis3/maps/deep folder/made+1.pyr" + ending
        gdal.VSICurlClearCache()
        if gdal.VSIStatL(name) is None:
            return None
        file = gdal.VSIFOpenL(name, "rb")
        content = bytes(gdal.VSIFReadL(1, 1 << 28, file))
        gdal.VSIFCloseL(file)
        return content

    def test_orderings_and_part_sizes_are_that_of_build(self):
        ways = (("UInt16", 3, (), "9999x256"), ("Byte", 3, ("--ordering", "scanline"), "512"),
                ("Int16", 12, (), "512"), ("Single", 1, ("--levels", "1"), "300x900"),
                ("Double", 9, ("--resampling", "cubic"), "1024"), ("Byte", 1, ("--embed",), "9999"))
        for type_name, bands, options, size in drawn(ways, 3):
            with self.subTest((type_name, bands, options, size)):
                self.source(type_name, bands=bands)
                expected = self.expected(*options)
                self.make(*options, "--overwrite", size=size)
                self.assertStored(expected)

    def test_types_are_that_of_build(self):
        for name in drawn(TYPES, 2):
            with self.subTest(name):
                self.source(name, bands=2)
                expected = self.expected()
                self.make("--overwrite")
                self.assertStored(expected)

    def test_source_in_the_store_is_read(self):
        self.source("Byte", bands=3)
        expected = self.expected()
        self.make()
        content = self.content("source.tif")
        file = gdal.VSIFOpenL("/vsis3/maps/source.tif", "wb")
        gdal.VSIFWriteL(content, 1, len(content), file)
        gdal.VSIFCloseL(file)
        os.rename(self.path("source.tif"), self.path("elsewhere.tif"))
        plan = self.document("plan", "/vsis3/maps/source.tif", "/vsis3/maps/second.pyr", "--plan", "second.plan")
        self.good("part", "second.plan", f"0-{plan['parts'] - 1}")
        self.good("finish", "second.plan")
        self.assertEqual(gdal.Open("/vsis3/maps/second.pyr").ReadRaster(),
                         gdal.Open(self.path("elsewhere.tif")).ReadRaster())
        self.assertEqual(len(self.stored()), len(expected[0]))

    def test_wrong_keys_and_missing_buckets_are_named(self):
        self.source("Byte")
        self.refused(1, "s3://nowhere/a.pyr: cannot begin its upload: the store answers 404, NoSuchBucket: The specified "
                     "bucket does not exist; make the bucket, or name another one",
                     "plan", "source.tif", "s3://nowhere/a.pyr")
        self.environment(AWS_ACCESS_KEY_ID="nobody", AWS_SECRET_ACCESS_KEY="hush")
        done = self.run_tool("plan", "source.tif", TARGET)
        self.assertEqual(done.returncode, 1)
        self.assertRegex(done.stderr, "^zmcraster: s3://.*: the store answers 403.*look at AWS_ACCESS_KEY_ID and "
                         "AWS_SECRET_ACCESS_KEY, and at what they may do\n$")
        self.assertNotIn("hush", done.stderr)
        self.assertEqual(self.files(), ["source.tif"])


class Workers(StoreTest):
    def test_parts_at_once_twice_and_killed_are_that_of_build(self):
        self.source("Double")
        expected = self.expected()
        parts = self.plan_store()
        workers = [subprocess.Popen([TOOL, "part", PLAN, *map(str, random.Random(PHASE + seed).sample(
            range(parts), parts))], cwd=self.folder) for seed in range(3)]
        time.sleep(0.1)
        workers[0].send_signal(signal.SIGKILL)
        self.assertEqual([worker.wait() for worker in workers][1:], [0, 0])
        self.good("finish", PLAN)
        self.assertStored(expected)
        self.assertEqual(self.store.uploads, {})

    def test_scratch_of_a_killed_worker_goes_with_the_plan(self):
        self.source("Byte")
        expected = self.expected()
        for discarded in (False, True):
            with self.subTest(discarded=discarded):
                parts = self.plan_store("--overwrite")
                self.good("part", PLAN, f"0-{parts - 1}")
                # As one leaves it that was killed while others were at work, who no longer look.
                with open(self.path(f".{PLAN}.zmcscratch-99-12345.tmp"), "wb") as left:
                    left.write(b"tiles")
                self.good("finish", PLAN, *(["--discard"] if discarded else []))
                self.assertStored(expected)

    def test_counts_that_workers_make_are_that_of_build(self):
        for bands in (1, 9):
            with self.subTest(bands):
                self.source("Single", bands=bands)
                expected = self.expected()
                parts = self.plan_store("--overwrite")
                self.good("part", PLAN, f"0-{parts - 1}")
                self.good("part", PLAN, "0-2", "--count")
                self.assertEqual(self.document("status", PLAN)["counted"], 3)
                self.good("finish", PLAN)
                self.assertStored(expected)

    def test_missing_and_damaged_parts_are_named(self):
        self.source("Byte", bands=3)
        expected = self.expected()
        parts = self.plan_store()
        self.good("part", PLAN, f"1-{parts - 1}")
        self.assertEqual(self.document("status", PLAN)["missing"], [0])
        self.refused(1, f"{PLAN}: 1 of {parts} parts are missing: 0", "finish", PLAN)
        self.good("part", PLAN, 0)
        with open(self.pyramid_path() + ".parts/1.pieces", "r+b") as file:
            file.write(b"no")
        os.remove(self.pyramid_path() + ".parts/2.store")
        self.refused(1, f"{PLAN}: 2 of {parts} parts are missing: 1-2", "finish", PLAN)
        self.assertIsNone(self.stored())
        self.good("part", PLAN, "1-2")
        self.good("finish", PLAN)
        self.assertStored(expected)

    def test_georeference_goes_beside_the_object_and_away_with_it(self):
        self.source("Byte")
        self.kind = "placed"
        dataset = gdal.Open(self.path("source.tif"), gdal.GA_Update)
        reference = osr.SpatialReference()
        reference.ImportFromEPSG(32631)
        dataset.SetSpatialRef(reference)
        dataset.SetGeoTransform([10, 1, 0, 20, 0, -1])
        dataset = None
        expected = self.expected()
        self.assertIsNotNone(expected[1])
        self.make()
        self.assertStored(expected)
        self.make("--embed", "--overwrite")
        self.assertIsNone(self.stored(".aux.xml"))

    def test_scratch_folder_is_used_and_left_empty(self):
        self.source("Byte")
        os.mkdir(self.path("scratch"))
        parts = self.plan_store()
        self.good("part", PLAN, f"0-{parts - 1}", "--scratch", "scratch")
        self.assertEqual(os.listdir(self.path("scratch")), [])
        self.refused(1, "nowhere: no file can be made there: No such file or directory",
                     "part", PLAN, 0, "--scratch", "nowhere")

    def test_objects_are_replaced_only_where_that_is_asked_for(self):
        self.source("Byte")
        self.make()
        before = self.stored()
        self.refused(1, f"{TARGET}: the object exists already; --overwrite replaces it",
                     "plan", "source.tif", TARGET)
        self.store.objects.clear()
        parts = self.plan_store()
        self.good("part", PLAN, f"0-{parts - 1}")
        self.store.objects["/maps/deep folder/made+1.pyr"] = b"somebody's", ""
        self.refused(1, f"{TARGET}: the object has changed since the plan was made; --overwrite replaces it",
                     "finish", PLAN)
        self.good("finish", PLAN, "--overwrite")
        self.assertEqual(self.stored(), before)

    def test_discarding_ends_the_upload(self):
        self.source("Byte")
        self.plan_store()
        self.assertEqual(len(self.store.uploads), 1)
        self.good("finish", PLAN, "--discard")
        self.assertEqual(self.store.uploads, {})
        self.assertEqual(self.files(), ["source.tif"])

    def test_plan_of_usual_sizes_has_most_bytes_in_ranges_of_one_part(self):
        self.source("Byte", height=6000, width=8000, bands=3)
        expected = self.expected()
        parts = self.document("plan", "source.tif", TARGET)["parts"]
        self.good("part", PLAN, f"0-{parts - 1}")
        folder = self.pyramid_path() + ".parts"
        pieces = sum(os.path.getsize(os.path.join(folder, name)) for name in os.listdir(folder)
                     if name.endswith(".pieces"))
        self.assertLess(pieces, len(expected[0]) / 8)
        sizes = [int(headers["Content-Length"]) for kind, _, headers in self.store.asked if kind == "part"]
        self.assertGreaterEqual(min(sizes), 5 << 20)
        self.good("finish", PLAN)
        self.assertStored(expected)


class Faults(StoreTest):
    def setUp(self):
        super().setUp()
        self.source("Byte", bands=3)
        self.wanted = self.expected()

    def assertMadeDespite(self):
        self.make()
        self.assertStored(self.wanted)

    def test_busy_stores_and_broken_connections_are_tried_again(self):
        def busy(request):
            request.answer(503, error("SlowDown", "Reduce your request rate"))
            request.close_connection = True

        def cut(request):
            request.rfile.read(min(10, int(request.headers.get("Content-Length", 0))))
            request.close_connection = True

        def half(request):
            request.wfile.write(b"HTTP/1.1 200 OK\r\nContent-Length: 100\r\n\r\n<half")
            request.close_connection = True

        for kind in ("begin", "part", "complete"):
            self.store.faults[kind] = [busy, cut, half]
        self.store.faults["HEAD"] = [busy, cut]
        self.assertMadeDespite()

    def test_lasting_faults_end_in_one_line_and_nothing_appears(self):
        # A connection that is closed with bytes unread takes its answer with it.
        def take(request):
            request.rfile.read(int(request.headers.get("Content-Length", 0)))

        def answers(status, body, headers=None):
            def fault(request):
                take(request)
                request.answer(status, body, headers)
                request.close_connection = True
            return fault

        def endless(request):
            take(request)
            request.wfile.write(b"HTTP/1.1 200 OK\r\n\r\n")
            for _ in range(100):
                request.wfile.write(b"x" * 65536)
            request.close_connection = True

        def headers(request):
            take(request)
            request.wfile.write(b"HTTP/1.1 200 OK\r\n" + b"X-More: many\r\n" * 100000 + b"\r\n")
            request.close_connection = True

        page = b"<html><body>Welcome \x1b[31m</body></html>"
        cases = (
            (answers(200, page), "the store answers 200 and not what was asked for"),
            (answers(503, error("SlowDown", "wait")), "the store answers 503, SlowDown: wait; try again later"),
            (answers(403, error("AccessDenied", "no\n\x1b[2J")), "the store answers 403, AccessDenied: no"),
            (answers(301, b""), "the store answers 301; look at AWS_REGION"),
            (endless, "its answer is longer than an answer of a store"),
            (headers, "its answer has more headers than an answer of a store"))
        parts = self.plan_store()
        self.good("part", PLAN, f"1-{parts - 1}")
        for kind in ("part", "complete", "begin"):
            for fault, words in cases:
                with self.subTest((kind, words)):
                    self.store.faults = {kind: fault}
                    if kind == "complete" and self.document("status", PLAN)["missing"]:
                        self.good("part", PLAN, 0)
                    command = {"part": ("part", PLAN, 0), "complete": ("finish", PLAN),
                               "begin": ("plan", "source.tif", "s3://maps/other.pyr")}[kind]
                    done = self.run_tool(*command)
                    self.assertEqual((done.returncode, done.stdout), (1, ""), done)
                    self.assertRegex(done.stderr, r"^zmcraster: s3://maps/[^\n]*\n$")
                    self.assertIn(words, done.stderr)
                    self.assertNotIn("\x1b", done.stderr)
                    self.assertEqual(self.store.objects, {})
        self.store.faults = {}
        self.good("finish", PLAN)
        self.assertStored(self.wanted)

    def test_answer_to_the_last_request_that_is_lost_is_made_up_for(self):
        def lost(request):
            request.body = request.rfile.read(int(request.headers["Content-Length"]))
            self.store.take(request)
            request.close_connection = True
        self.store.faults["complete"] = [lost]
        self.assertMadeDespite()

    def test_upload_that_somebody_ended_is_told(self):
        parts = self.plan_store()
        self.good("part", PLAN, f"1-{parts - 1}")
        kept = dict(self.store.uploads)
        self.store.uploads.clear()
        gone = ("the store does not know the upload any more (NoSuchUpload); plan again with --overwrite")
        done = self.run_tool("part", PLAN, 0)
        self.assertEqual(done.returncode, 1)
        self.assertIn(gone, done.stderr)
        self.store.uploads.update(kept)
        self.good("part", PLAN, 0)
        self.store.uploads.clear()
        done = self.run_tool("finish", PLAN)
        self.assertEqual((done.returncode, self.store.objects), (1, {}))
        self.assertIn(gone, done.stderr)
        self.good("part", PLAN, "--help")
        self.good("finish", PLAN, "--discard")

    def test_tags_that_are_not_the_store_s_are_refused_by_it(self):
        def wrong(request):
            request.rfile.read(int(request.headers["Content-Length"]))
            request.answer(200, b"", {"ETag": '"of something else"'.replace(" ", "-")})
        parts = self.plan_store(size="9999x256")
        self.store.faults["part"] = [wrong]
        self.good("part", PLAN, f"0-{parts - 1}")
        self.store.faults = {}
        done = self.run_tool("finish", PLAN)
        self.assertEqual((done.returncode, self.store.objects), (1, {}))
        self.assertIn("InvalidPart: One or more of the specified parts could not be found; the store has other parts",
                      done.stderr)
        self.good("part", PLAN, f"0-{parts - 1}")
        self.good("finish", PLAN)
        self.assertStored(self.wanted)

    def test_interruption_ends_the_waiting(self):
        held = []

        def silent(request):
            held.append(request)
            time.sleep(5)
        self.plan_store()
        self.store.faults["part"] = silent
        worker = subprocess.Popen([TOOL, "part", PLAN, "0"], cwd=self.folder, stderr=subprocess.PIPE, text=True)
        while not held:
            self.assertIsNone(worker.poll())
            time.sleep(0.01)
        worker.send_signal(signal.SIGINT)
        said = worker.communicate(timeout=4)[1]
        self.assertEqual((worker.returncode, said), (130, f"zmcraster: {TARGET}: interrupted\n"))
        self.assertEqual(len(self.hidden()), 2)

    def test_wrong_secret_is_told_and_kept(self):
        self.environment(AWS_SECRET_ACCESS_KEY="hush")
        self.refused(1, f"{TARGET}: cannot look whether it is there: the store answers 403; look at AWS_ACCESS_KEY_ID "
                     "and AWS_SECRET_ACCESS_KEY, and at what they may do", "plan", "source.tif", TARGET)
        self.assertEqual(self.store.objects, {})

    def test_nothing_answers(self):
        self.store.close()
        done = self.run_tool("plan", "source.tif", TARGET)
        self.assertEqual(done.returncode, 1)
        self.assertRegex(done.stderr, "^zmcraster: s3://[^\n]*look at AWS_S3_ENDPOINT and AWS_HTTPS, or try again later\n$")
        self.assertEqual(self.files(), ["source.tif"])

    def test_words_that_cannot_be_are_refused(self):
        for name in ("s3://maps", "s3://maps/", "s3:///key", "/vsis3/ma ps/key", "s3://maps/folder/"):
            self.refused(1, f"{name}: it names no object; one is named s3://BUCKET/KEY", "plan", "source.tif", name)
        self.refused(2, "--upload-part: the target is a file, and its plan stands beside it",
                     "plan", "source.tif", "a.pyr", "--upload-part", "5M")
        self.refused(2, "--upload-part: a part of an upload has from 1 byte to 2.5 GiB at least",
                     "plan", "source.tif", TARGET, "--upload-part", "0")
        self.environment(AWS_S3_ENDPOINT="http://user@host/")
        self.refused(1, f"{TARGET}: AWS_S3_ENDPOINT names no server; one is named HOST or HOST:PORT",
                     "plan", "source.tif", TARGET)
        self.environment(AWS_SECRET_ACCESS_KEY="")
        self.refused(1, f"{TARGET}: set AWS_ACCESS_KEY_ID and AWS_SECRET_ACCESS_KEY, or AWS_NO_SIGN_REQUEST=YES for a "
                     "store that wants none", "plan", "source.tif", TARGET)

    def test_no_file_keeps_a_secret(self):
        self.store.secret = "much-too-secret"
        self.environment(AWS_SECRET_ACCESS_KEY="much-too-secret", AWS_SESSION_TOKEN="a-token-too")
        self.good("part", PLAN, f"0-{self.plan_store() - 1}")
        for folder, _, names in os.walk(self.folder):
            for name in names:
                with open(os.path.join(folder, name), "rb") as file:
                    content = file.read()
                self.assertNotIn(b"much-too-secret", content)
                self.assertNotIn(b"a-token-too", content)
