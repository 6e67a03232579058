"""The hash of samples, against hashlib."""
import hashlib
import json

from frame import COUNT, TYPES, ToolTest, geotiff, no_new_threads, samples
from pyramid import Pyramid


class Hash(ToolTest):
    def test_every_type(self):
        for name in TYPES:
            with self.subTest(name):
                pixels = samples(name, 130, 301, 2)
                geotiff(self.path("source.tif"), pixels, name)
                self.good("build", "source.tif", "made.pyr", "--overwrite")
                expected = hashlib.sha256(pixels.tobytes()).hexdigest()
                self.assertEqual(self.document("hash", "made.pyr")["sha256"], expected)
                self.assertEqual(self.document("hash", "source.tif")["sha256"], expected)

    def test_level_window_and_bands(self):
        self.pyramid()
        part = Pyramid(self.path("picture.pyr")).read(1)[20:120, 30:330][:, :, [2, 0]]
        document = self.document("hash", "picture.pyr", "--level", 1, "--window", "30,20,300,100",
                                 "--bands", "3,1")
        self.assertShape(document, {"schema": int, "file": str, "level": int, "window": [int],
                                    "bands": [int], "pixelType": str, "bytes": COUNT,
                                    "sha256": str})
        self.assertEqual(document["sha256"], hashlib.sha256(part.tobytes()).hexdigest())
        self.assertEqual((document["window"], document["bands"]), ([30, 20, 300, 100], [3, 1]))
        self.assertEqual(document["bytes"], part.nbytes)

    def test_rasters_beyond_one_strip(self):
        pixels = samples("Double", 1100, 2000, 3)
        geotiff(self.path("source.tif"), pixels, "Double")
        self.good("build", "source.tif", "made.pyr")
        digest = hashlib.sha256(pixels.tobytes()).hexdigest()
        self.assertEqual(self.good("hash", "made.pyr"), f"{digest}  made.pyr\n")
        part = pixels[100:1001, 7:1999]
        digest = hashlib.sha256(part.tobytes()).hexdigest()
        self.assertEqual(
            self.document("hash", "made.pyr", "--window", "7,100,1992,901")["sha256"], digest)

    def test_where_no_thread_can_be_had(self):
        pixels = samples("Double", 1100, 2000, 3)
        geotiff(self.path("source.tif"), pixels, "Double")
        digest = hashlib.sha256(pixels.tobytes()).hexdigest()
        self.assertEqual(self.good("hash", "source.tif", preexec_fn=no_new_threads),
                         f"{digest}  source.tif\n")

    def test_lines_beyond_one_strip(self):
        pixels = samples("Double", 2, 2200000, 2)
        geotiff(self.path("source.tif"), pixels, "Double")
        digest = hashlib.sha256(pixels.tobytes()).hexdigest()
        self.assertEqual(self.good("hash", "source.tif"), f"{digest}  source.tif\n")

    def test_many_files(self):
        digests = {}
        for number, name in enumerate(("a.tif", "b.tif", "c.tif")):
            digests[name] = hashlib.sha256(self.picture(name, 20, 30, seed=number)).hexdigest()
        self.assertEqual(len(set(digests.values())), 3)
        lines = "".join(f"{digests[name]}  {name}\n" for name in ("c.tif", "a.tif", "b.tif"))
        self.assertEqual(self.good("hash", "c.tif", "a.tif", "--level", 0, "b.tif"), lines)
        document = self.document("hash", "c.tif", "a.tif", "--bands", "2")
        self.assertEqual(list(document), ["schema", "files"])
        for name, told in zip(("c.tif", "a.tif"), document["files"], strict=True):
            alone = self.document("hash", name, "--bands", "2")
            del alone["schema"]
            self.assertEqual(told, alone)

    def test_a_file_that_fails_does_not_keep_the_others_from_theirs(self):
        digest = hashlib.sha256(self.picture("a.tif", 20, 30)).hexdigest()
        self.picture("small.tif", 2, 2)
        done = self.run_tool("hash", "nonesuch", "a.tif", "small.tif", "--window", "0,0,30,20")
        self.assertEqual(done.stdout, f"{digest}  a.tif\n")
        self.assertEqual(done.stderr,
                         "zmcraster: nonesuch: there is no such file\n"
                         "zmcraster: small.tif: --window: 0,0,30,20 is not inside the level, "
                         "which has 2 x 2 pixels\n")
        self.assertEqual(done.returncode, 1)
        done = self.run_tool("hash", "small.tif", "a.tif", "nonesuch", "--window", "0,0,30,20",
                             "--json")
        self.assertEqual((done.returncode, done.stderr.count("\n")), (2, 2))
        files = json.loads(done.stdout)["files"]
        self.assertEqual(files[1]["sha256"], digest)
        self.assertEqual(files[2], {"file": "nonesuch",
                                    "error": "nonesuch: there is no such file"})
        self.assertEqual(list(files[0]), ["file", "error"])

    def test_an_incomplete_file_has_hashes_of_what_is_there(self):
        self.pyramid()
        parts = (("--level", "1"), ("--window", "0,0,700,256"), ("--window", "0,0,512,300"))
        before = [self.good("hash", "picture.pyr", *part) for part in parts]
        with open(self.path("picture.pyr"), "r+b") as handle:
            handle.truncate(Pyramid(self.path("picture.pyr")).end - 1)
        for part, digest in zip(parts, before):
            done = self.run_tool("hash", "picture.pyr", *part)
            self.assertEqual((done.returncode, done.stdout), (0, digest))
            self.assertEqual(done.stderr, "zmcraster: picture.pyr: warning: the pyramid is "
                             "incomplete, 1 bytes of tiles are missing; what is there is read\n")
        done = self.run_tool("hash", "picture.pyr")
        self.assertEqual((done.returncode, done.stdout), (1, ""))
