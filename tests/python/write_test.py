"""Rasters that are written window by window."""
import filecmp
import os
import shutil

import numpy as np
import pytest

import zmcraster
from conftest import TYPES, samples


@pytest.mark.parametrize("dtype", TYPES)
def test_windows_make_the_file_that_a_build_makes(folder, dtype):
    array = samples(dtype, (2, 600, 530))
    zmcraster.build(array, "expected.pyr")
    with zmcraster.create("written.pyr", 530, 600, 2, dtype) as raster:
        assert raster.mode == "w" and not os.path.exists("written.pyr")
        for y in range(0, 600, 256):
            for x in range(0, 530, 256):
                part = array[:, y:y + 256, x:x + 256]
                raster.write(part, window=(x, y, part.shape[2], part.shape[1]))
    assert filecmp.cmp("written.pyr", "expected.pyr", shallow=False)


def test_what_a_new_raster_is_told(folder):
    with zmcraster.create("told.pyr", 300, 200, 2, "float32", crs="EPSG:4326", transform=(1, 0, 5, 0, -1, 6), nodata=-9,
                          descriptions=("first", None), levels=1, resampling="nearest", metadata={"A": "b"}) as raster:
        raster.write(np.ma.masked_equal(np.arange(60000, dtype=np.float32).reshape(200, 300), 5), bands=2)
    with zmcraster.open("told.pyr") as raster:
        assert raster.nodatavals == (-9, -9) and raster.transform == (1, 0, 5, 0, -1, 6)
        assert raster.descriptions == ("first", "") and raster.metadata["A"] == "b" and len(raster.levels) == 2
        assert raster.read(1).min() == raster.read(1).max() == -9
        assert raster.read(2)[0, 4:7].tolist() == [4, -9, 6]
        assert raster.read(2, level=1)[0, 0] == 0
        assert raster.statistics(2).maximum == 59999


def test_a_block_that_raises_leaves_nothing(folder):
    with pytest.raises(KeyError):
        with zmcraster.create("not.pyr", 300, 300) as raster:
            raster.write(np.ones((300, 300), np.uint8))
            raise KeyError
    assert os.listdir() == []


def test_a_target_that_is_there(folder):
    zmcraster.build(np.zeros((300, 300), np.uint8), "there.pyr")
    with pytest.raises(zmcraster.FileError, match="exists"):
        zmcraster.create("there.pyr", 300, 300)
    with pytest.raises(KeyError):
        with zmcraster.create("there.pyr", 300, 300, overwrite=True):
            raise KeyError
    with zmcraster.open("there.pyr") as raster:
        assert raster.read(1)[0, 0] == 0
    with zmcraster.create("there.pyr", 300, 300, overwrite=True) as raster:
        raster.write(np.ones((300, 300), np.uint8))
    with zmcraster.open("there.pyr") as raster:
        assert raster.read(1)[0, 0] == 1


@pytest.mark.parametrize("words", (
    dict(width=0), dict(height=-1), dict(bands=0), dict(width=2**40), dict(bands=10**6), dict(dtype="U5"),
    dict(dtype=bool), dict(dtype="nothing"), dict(nodata=300), dict(levels=77), dict(resampling="magic"),
    dict(crs="no reference"), dict(width=10**9, height=10**9)))
def test_rasters_that_cannot_be_are_refused(folder, words):
    with pytest.raises(zmcraster.Error) as refused:
        zmcraster.create("not.pyr", **{**dict(width=300, height=300), **words})
    assert len(str(refused.value).splitlines()) == 1
    assert os.listdir() == []


@pytest.mark.parametrize("dtype", ("u1", "i1", "f8", "c8"))
@pytest.mark.parametrize("bands", (2, 9))
def test_changing_a_window_renews_levels_and_statistics(folder, dtype, bands):
    array = samples(dtype, (bands, 600, 530))
    changed = array.copy()
    changed[:, 33:333, 44:444] = samples(dtype, (bands, 300, 400), seed=2)
    zmcraster.build(array, "edited.pyr")
    zmcraster.build(changed, "expected.pyr")
    with zmcraster.open("edited.pyr", "r+") as raster:
        np.testing.assert_array_equal(raster.read(), array)
        raster.write(changed[:, 33:333, 44:444], window=(44, 33, 400, 300))
        np.testing.assert_array_equal(raster.read(), changed)
    with zmcraster.open("edited.pyr") as raster, zmcraster.open("expected.pyr") as expected:
        for level in raster.levels:
            np.testing.assert_array_equal(raster.read(level=level.number), expected.read(level=level.number))
        assert raster.statistics(bands) == expected.statistics(bands)
        if np.dtype(dtype).kind != "c":
            np.testing.assert_array_equal(raster.histogram(1).counts, expected.histogram(1).counts)


def test_bands_and_single_arrays(folder, scene_file, scene_array):
    shutil.copy(scene_file, "scene.pyr")
    with zmcraster.open("scene.pyr", "r+", refresh=False) as raster:
        raster.write(np.zeros((5, 6), np.uint8), bands=2, window=(10, 20, 6, 5))
        raster.write(np.broadcast_to(np.uint8(1), (2, 4, 4)), bands=[3, 1], window=(0, 0, 4, 4))
        raster.write(scene_array[:, ::-1, ::-1][:, :4, :4], window=(100, 0, 4, 4))
        old = raster.read(level=1)
    expected = scene_array.copy()
    expected[1, 20:25, 10:16] = 0
    expected[[0, 2], :4, :4] = 1
    expected[:, :4, 100:104] = scene_array[:, ::-1, ::-1][:, :4, :4]
    with zmcraster.open("scene.pyr") as raster:
        np.testing.assert_array_equal(raster.read(), expected)
        np.testing.assert_array_equal(raster.read(level=1), old)
        assert raster.statistics(1) is None


def test_nothing_written_changes_nothing(folder, scene_file):
    shutil.copy(scene_file, "scene.pyr")
    with zmcraster.open("scene.pyr", "r+") as raster:
        raster.read(1)
    assert filecmp.cmp("scene.pyr", scene_file, shallow=False)


@pytest.mark.parametrize("array, words", (
    (np.zeros((3, 600, 701), np.uint8), {}), (np.zeros((600, 700), np.uint8), {}), (np.zeros((3, 600, 700)), {}),
    (np.zeros((3, 1, 1), np.uint8), dict(window=(700, 0, 1, 1))), (np.zeros((3, 0, 0), np.uint8), dict(window=(0, 0, 0, 0))),
    (np.zeros((600, 700), np.uint8), dict(bands=4)), ("text", {}), (None, {})))
def test_arrays_that_do_not_fit_are_refused(folder, scene_file, array, words):
    shutil.copy(scene_file, "scene.pyr")
    with zmcraster.open("scene.pyr", "r+") as raster:
        with pytest.raises(zmcraster.ArgumentError):
            raster.write(array, **words)
    assert filecmp.cmp("scene.pyr", scene_file, shallow=False)


def test_rasters_that_are_open_for_reading(scene_file, folder):
    with zmcraster.open(scene_file) as raster, pytest.raises(zmcraster.FileError):
        raster.write(np.zeros((3, 600, 700), np.uint8))
    if os.getuid() != 0:
        shutil.copy(scene_file, "scene.pyr")
        os.chmod("scene.pyr", 0o444)
        with pytest.raises(zmcraster.FileError):
            zmcraster.open("scene.pyr", "r+")
