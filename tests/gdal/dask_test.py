"""The example programs on a cluster of worker processes, as a user runs them."""
import os
import re
import subprocess
import sys
import unittest

from osgeo import gdal
from rasters import DRIVER, FolderTest, memory_dataset, samples

EXAMPLES = os.path.join(os.path.dirname(__file__), "..", "..", "examples")


def run(name, *arguments):
    done = subprocess.run([sys.executable, os.path.join(EXAMPLES, name), *arguments],
                          stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True, check=False)
    if done.returncode != 0 or "Warning" in done.stderr:
        raise AssertionError(done.stderr)
    return done.stdout


class Examples(FolderTest):
    def make(self, data_type, bands):
        name = os.path.join(self.folder, "a.pyr")
        array = samples(data_type, 700, 900, bands)
        gdal.GetDriverByName(DRIVER).CreateCopy(name, memory_dataset(array, data_type))
        return name, array

    def test_statistics_on_worker_processes_agree_with_the_archive(self):
        name, array = self.make(gdal.GDT_UInt16, 2)
        text = run("dask_statistics.py", name, "--workers", "2")
        self.assertIn("level 0: 900 x 700, 2 bands", text)
        self.assertIn("2 workers", text)
        for band in (1, 2):
            computed, stored = re.search(
                rf"band {band}: (minimum .*)\n  stored: (minimum .*)\n", text).groups()
            self.assertEqual(computed, stored)
            self.assertIn(f"minimum {array[band - 1].min():d} ", computed)
        self.assertRegex(text, r"index of bands 1 and 2: mean -?[0-9.e-]+, above zero 0\.[45]")

    def test_statistics_of_a_chosen_level(self):
        name, _ = self.make(gdal.GDT_Byte, 1)
        self.assertIn("level 1: 450 x 350, 1 bands", run("dask_statistics.py", name, "--level",
                                                         "1"))

    def test_levels_as_one_dictionary(self):
        name, array = self.make(gdal.GDT_Float32, 3)
        lines = run("levels.py", name).splitlines()
        self.assertEqual([line.split(",")[0] for line in lines],
                         ["level 0: 900 x 700", "level 1: 450 x 350", "level 2: 225 x 175"])
        self.assertIn(f"mean {array.mean(dtype='f8'):.6g}", lines[0])


if __name__ == "__main__":
    unittest.main()
