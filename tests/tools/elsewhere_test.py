"""Commands on names of GDAL's file systems and on URLs."""
import os
import sys
import unittest
import zipfile

from frame import ToolTest

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "gdal"))
from server import Server  # noqa: E402


class Elsewhere(ToolTest):
    def setUp(self):
        super().setUp()
        self.pyramid()
        with zipfile.ZipFile(self.path("a.zip"), "w") as archive:
            archive.write(self.path("picture.pyr"), "in/picture.pyr")
        self.server = Server(os.path.dirname(self.path("a.zip")))
        self.addCleanup(self.server.stop)
        self.names = [f"/vsizip/{self.path('a.zip')}/in/picture.pyr",
                      "/vsicurl/" + self.server.url + "picture.pyr",
                      self.server.url + "picture.pyr"]

    def refuse(self, *words, contains):
        done = self.run_tool(*words)
        self.assertEqual((done.returncode, done.stdout), (1, ""))
        self.assertIn(contains, done.stderr)
        self.assertEqual(done.stderr.count("\n"), 1)

    def test_info_tells_what_it_tells_of_the_file(self):
        expected = self.document("info", "picture.pyr")
        for name in self.names:
            self.assertEqual(self.document("info", name), {**expected, "file": name})

    def test_hash_is_that_of_the_file(self):
        expected = self.document("hash", "picture.pyr", "--level", 1)["sha256"]
        for name in self.names:
            self.assertEqual(self.document("hash", name, "--level", 1)["sha256"], expected)

    def test_a_window_of_a_url_is_few_requests(self):
        self.server.take()
        self.good("hash", self.names[2], "--window", "0,0,300,200")
        ranges = [request.range for request in self.server.take()]
        self.assertLessEqual(len(ranges), 2)
        self.assertNotIn(None, ranges)

    def test_compare_and_verify(self):
        for name in self.names:
            self.good("compare", name, "picture.pyr")
            self.good("verify", name)
            self.good("verify", "picture.pyr", "--against", name)

    def test_export_and_build(self):
        for name in self.names:
            self.good("export", name, "level.tif", "--level", 1)
            self.assertEqual(self.document("hash", "level.tif")["sha256"],
                             self.document("hash", "picture.pyr", "--level", 1)["sha256"])
            self.good("build", name, "again.pyr", "--overwrite")
            self.good("compare", "again.pyr", "picture.pyr")

    def test_what_cannot_be_done_there_is_refused_in_one_line(self):
        for words in (("build", "picture.pyr", "/vsimem/a.pyr"),
                      ("build", "picture.pyr", self.server.url + "a.pyr"),
                      ("recover", self.names[0])):
            self.refuse(*words, contains="plain")

    def test_what_is_not_there_is_told_in_one_line(self):
        for name in (self.server.url + "none.pyr", "/vsicurl/" + self.server.url + "none.pyr",
                     "/vsimem/none.pyr", f"/vsizip/{self.path('a.zip')}/none.pyr"):
            for command in ("info", "hash", "verify"):
                self.refuse(command, name, contains="none.pyr")


if __name__ == "__main__":
    unittest.main()
