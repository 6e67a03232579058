"""The hash of samples, against hashlib."""
import hashlib

from frame import COUNT, TYPES, ToolTest, geotiff, samples
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

    def test_lines_beyond_one_strip(self):
        pixels = samples("Double", 2, 2200000, 2)
        geotiff(self.path("source.tif"), pixels, "Double")
        digest = hashlib.sha256(pixels.tobytes()).hexdigest()
        self.assertEqual(self.good("hash", "source.tif"), f"{digest}  source.tif\n")

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
