"""What a user of the installed package does first; the prefix is the argument."""
import importlib.metadata
import os
import sys

import numpy as np
import xarray

import zmcraster

prefix = os.path.realpath(sys.argv[1])
assert os.path.realpath(zmcraster.__file__).startswith(prefix + os.sep), zmcraster.__file__
assert importlib.metadata.version("zmcraster") == zmcraster.__version__
pixels = np.arange(600 * 500, dtype=np.int32).reshape(600, 500)
zmcraster.build(pixels, "made.pyr", crs="EPSG:4326")
with zmcraster.open("made.pyr") as raster:
    np.testing.assert_array_equal(raster.read(1), pixels)
with xarray.open_dataset("made.pyr", engine="zmcraster", level=1) as scene:
    assert scene.band_data.shape == (1, 300, 250)
with open("/proc/self/maps", encoding="utf-8") as maps:
    ours = {line.split()[-1] for line in maps if "zmc" in line.rsplit("/", 1)[-1]}
assert len(ours) > 3 and all(os.path.realpath(each).startswith(prefix + os.sep) for each in ours), ours
