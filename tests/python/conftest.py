"""What the tests of the Python package share."""
import os
import subprocess
import sys

import numpy as np
import pytest

sys.path.insert(0, os.path.join(os.path.dirname(__file__), "..", "tools"))

TYPES = ("u1", "i1", "u2", "i2", "u4", "i4", "u8", "i8", "f4", "f8", "c8", "c16")
TOOL = os.environ["ZMC_TOOL"]


def samples(dtype, shape, seed=1):
    """Random samples over the whole range of a type."""
    dtype = np.dtype(dtype)
    random = np.random.default_rng(seed)
    if dtype.kind == "c":
        return (random.normal(0, 1e3, shape) + 1j * random.normal(0, 1e3, shape)).astype(dtype)
    if dtype.kind == "f":
        return random.normal(0, 1e6, shape).astype(dtype)
    limits = np.iinfo(dtype)
    return random.integers(limits.min, limits.max, shape, dtype=dtype, endpoint=True)


def run_tool(*words, folder=None):
    return subprocess.run([TOOL, *map(str, words)], cwd=folder, check=True, stdout=subprocess.PIPE).stdout


@pytest.fixture
def folder(tmp_path, monkeypatch):
    """An empty folder, which is the current one."""
    monkeypatch.chdir(tmp_path)
    return tmp_path


@pytest.fixture(scope="session")
def scene_array():
    array = samples("u1", (3, 600, 700))
    array[:, 100:200, 50:90] = 9
    return array


@pytest.fixture(scope="session")
def scene_file(tmp_path_factory, scene_array):
    """A georeferenced raster of three bands, which nobody changes."""
    import zmcraster
    path = str(tmp_path_factory.mktemp("scene") / "scene.pyr")
    zmcraster.build(scene_array, path, crs="EPSG:32631", transform=(30, 0, 500000, 0, -30, 4000000), nodata=9,
                    descriptions=("red", "green", "blue"), metadata={"SENSOR": "made up"})
    return path
