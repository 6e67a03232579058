"""The engine of xarray, beside what rioxarray shows of the same file through GDAL."""
import shutil

import numpy as np
import pytest
import xarray as xr

import zmcraster
from conftest import samples


def test_the_engine_is_known_by_its_entry_point():
    assert "zmcraster" in xr.backends.list_engines()


def test_it_looks_as_rioxarray_shows_it(scene_file):
    import rioxarray  # noqa: F401
    ours = xr.open_dataset(scene_file, engine="zmcraster")
    other = xr.open_dataset(scene_file, engine="rasterio")
    xr.testing.assert_equal(ours, other)
    assert list(ours.band_data.dims) == list(other.band_data.dims)
    assert ours.spatial_ref.attrs == other.spatial_ref.attrs
    assert ours.band_data.dtype == other.band_data.dtype
    assert ours.band_data.attrs["long_name"] == other.band_data.attrs["long_name"]
    assert ours.rio.crs == other.rio.crs
    assert ours.rio.transform() == other.rio.transform()
    assert ours.band_data.rio.encoded_nodata == 9
    assert ours.band_data.rio.reproject("EPSG:4326").shape[0] == 3
    raw = xr.open_dataset(scene_file, engine="zmcraster", mask_and_scale=False)
    assert raw.band_data.dtype == np.uint8 and raw.band_data.rio.nodata == 9


def test_levels(scene_file):
    with xr.open_dataset(scene_file, engine="zmcraster", level=2, mask_and_scale=False) as coarse:
        assert coarse.band_data.shape == (3, 150, 175)
        assert coarse.x.values[0] == 500060 and coarse.y.values[1] == 4000000 - 180
        with zmcraster.open(scene_file) as raster:
            np.testing.assert_array_equal(coarse.band_data, raster.read(level=2))
    with pytest.raises(zmcraster.ArgumentError):
        xr.open_dataset(scene_file, engine="zmcraster", level=9)


@pytest.mark.parametrize("key", (
    np.s_[1], np.s_[0, 5], np.s_[:, 5:9, ::-1], np.s_[2, 599, 699], np.s_[-1, -3:, -5], np.s_[::2, ::100, 7:600:50],
    np.s_[:, 10:3], np.s_[[2, 0], 5:6], np.s_[:, [5, 3, 9]], np.s_[:, ::-7, 300:200:-3], np.s_[..., 0]))
def test_parts_are_read_as_numpy_takes_them(scene_file, scene_array, key):
    with xr.open_dataset(scene_file, engine="zmcraster", mask_and_scale=False, cache=False) as scene:
        np.testing.assert_array_equal(scene.band_data[key], scene_array[key])


def test_chunks_are_tiles(scene_file, scene_array):
    with xr.open_dataset(scene_file, engine="zmcraster", chunks={}, mask_and_scale=False) as scene:
        assert scene.band_data.chunks == ((3,), (256, 256, 88), (256, 256, 188))
        np.testing.assert_array_equal(scene.band_data.compute(), scene_array)
        # In another process the raster is opened once more.
        np.testing.assert_array_equal(scene.band_data[:, :300].compute(scheduler="processes", num_workers=1),
                                      scene_array[:, :300])


def test_bands_that_lie_apart_are_chunks(folder):
    zmcraster.build(samples("u2", (9, 300, 300)), "many.pyr")
    with xr.open_dataset("many.pyr", engine="zmcraster", chunks={}) as scene:
        assert scene.band_data.chunks[0] == (1,) * 9


def test_masked_and_scaled(scene_file, scene_array):
    with xr.open_dataset(scene_file, engine="zmcraster") as scene:
        np.testing.assert_array_equal(np.isnan(scene.band_data), scene_array == 9)


def test_without_a_place(folder):
    zmcraster.build(np.arange(12, dtype=np.int32).reshape(3, 4), "plain.pyr")
    with xr.open_dataset("plain.pyr", engine="zmcraster") as plain:
        assert plain.x.values.tolist() == [0.5, 1.5, 2.5, 3.5] and plain.y.values.tolist() == [0.5, 1.5, 2.5]
        assert "crs_wkt" not in plain.spatial_ref.attrs and plain.band_data.dtype == np.int32


def test_a_turned_raster(folder):
    zmcraster.build(np.zeros((3, 4), np.uint8), "turned.pyr", transform=(0, 2, 10, 3, 0, 20))
    with xr.open_dataset("turned.pyr", engine="zmcraster") as turned:
        assert turned.xc.dims == ("y", "x")
        assert float(turned.xc[1, 0]) == 13 and float(turned.yc[0, 1]) == 24.5


def test_names_and_files(scene_file, folder):
    shutil.copy(scene_file, "scene.pyr")
    with xr.open_dataset("scene.pyr") as guessed:
        assert guessed.band_data.shape == (3, 600, 700)
    with open("scene.pyr", "rb") as file, xr.open_dataset(file, engine="zmcraster") as scene:
        assert float(scene.band_data[0, 0, 0]) >= 0
    with pytest.raises(FileNotFoundError):
        xr.open_dataset("nothing.pyr", engine="zmcraster")


def test_closing(scene_file):
    scene = xr.open_dataset(scene_file, engine="zmcraster")
    scene.close()
    with pytest.raises(zmcraster.ArgumentError):
        scene.band_data[0].load()
