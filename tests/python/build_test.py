"""Rasters that are built of arrays, datasets and names."""
import filecmp
import os
import signal
import threading

import dask.array
import numpy as np
import pytest
import rasterio
from osgeo import gdal
from rasterio.vrt import WarpedVRT

import zmcraster
from conftest import TYPES, run_tool, samples

gdal.UseExceptions()
PLACE = dict(crs="EPSG:32631", transform=(30, 0, 500000, 0, -30, 4000000))


def write_tiff(path, array, **words):
    with rasterio.open(path, "w", driver="GTiff", width=array.shape[2], height=array.shape[1], count=array.shape[0],
                       dtype=array.dtype, **words) as out:
        out.write(array)


@pytest.mark.parametrize("dtype", [each for each in TYPES if each not in ("i1", "i8", "u8")])
def test_every_source_gives_the_file_of_the_command_line(folder, dtype):
    array = samples(dtype, (3, 290, 311))
    place = dict(crs=PLACE["crs"], transform=rasterio.Affine(*PLACE["transform"]), nodata=7)
    write_tiff("source.tif", array, **place)
    run_tool("build", "source.tif", "expected.pyr", "-q")
    chunked = dask.array.from_array(array, chunks=(2, 100, 200))
    with rasterio.open("source.tif") as dataset:
        for number, source in enumerate((array, chunked, dataset, "source.tif", folder / "source.tif",
                                         array.transpose(1, 2, 0).copy().transpose(2, 0, 1))):
            told = dict(**PLACE, nodata=7) if hasattr(source, "dtype") and hasattr(source, "ndim") else {}
            name = f"built{number}.pyr"
            report = zmcraster.build(source, name, **told)
            assert filecmp.cmp(name, "expected.pyr", shallow=False), source
            assert (report.width, report.height, report.bands) == (311, 290, 3)
            with zmcraster.open(name) as raster:
                assert raster.transform == PLACE["transform"] and "31N" in raster.crs and raster.nodata == 7


@pytest.mark.parametrize("dtype", ("i1", "i8", "u8"))
def test_types_that_gdal_does_not_show(folder, dtype):
    array = samples(dtype, (2, 300, 300))
    zmcraster.build(array, "whole.pyr")
    zmcraster.build(dask.array.from_array(array, chunks=(1, 77, 100)), "chunks.pyr")
    assert filecmp.cmp("whole.pyr", "chunks.pyr", shallow=False)
    with zmcraster.open("whole.pyr") as raster:
        assert raster.dtype == np.dtype(dtype)
        np.testing.assert_array_equal(raster.read(), array)


def test_options_are_those_of_the_command_line(folder):
    array = samples("u2", (3, 700, 900))
    write_tiff("source.tif", array)
    run_tool("build", "source.tif", "expected.pyr", "-q", "--levels", 1, "--resampling", "cubic", "--ordering", "scanline",
             "--nodata", 5, "--bands", "3,1", "--bins", 40, "--memory", "32M", "--threads", 1)
    options = dict(levels=1, resampling="cubic", ordering="scanline", nodata=5, bands=[3, 1], bins=40, memory="32M",
                   threads=1)
    zmcraster.build("source.tif", "named.pyr", **options)
    zmcraster.build(array, "array.pyr", **options)
    assert filecmp.cmp("named.pyr", "expected.pyr", shallow=False)
    assert filecmp.cmp("array.pyr", "expected.pyr", shallow=False)
    with zmcraster.open("array.pyr") as raster:
        assert raster.nodatavals == (5, 5)
    zmcraster.build(array, "few.pyr", no_statistics=True)
    with zmcraster.open("few.pyr") as raster:
        assert raster.statistics(1) is None and raster.histogram(1) is None


def test_alpha_weighs(folder):
    array = samples("u1", (4, 600, 600))
    array[3] = np.where(array[3] > 100, 255, 0)
    write_tiff("alpha.tif", array, photometric="RGB", alpha="yes")
    run_tool("build", "alpha.tif", "expected.pyr", "-q")
    zmcraster.build(array, "array.pyr", alpha=4)
    zmcraster.build(array, "plain.pyr", alpha=4, weights="none")
    assert filecmp.cmp("array.pyr", "expected.pyr", shallow=False)
    assert not filecmp.cmp("plain.pyr", "expected.pyr", shallow=False)


def test_masked_arrays(folder):
    array = np.ma.masked_less(samples("i2", (300, 400)), 0)
    zmcraster.build(array, "masked.pyr", nodata=-7)
    with zmcraster.open("masked.pyr") as raster:
        assert raster.nodata == -7
        back = raster.read(1, masked=True)
        np.testing.assert_array_equal(back.mask, array.mask)
        np.testing.assert_array_equal(back.compressed(), array.compressed())
    with pytest.raises(zmcraster.ArgumentError, match="no-data"):
        zmcraster.build(array, "filled.pyr")
    array.fill_value = -9
    zmcraster.build(array, "filled.pyr")
    with zmcraster.open("filled.pyr") as raster:
        assert raster.nodata == -9


def test_a_warped_dataset(folder):
    write_tiff("source.tif", samples("u1", (3, 300, 300)), crs=PLACE["crs"],
               transform=rasterio.Affine(*PLACE["transform"]), nodata=3)
    with rasterio.open("source.tif") as dataset, WarpedVRT(dataset, crs="EPSG:4326") as warped:
        zmcraster.build(warped, "warped.pyr")
        with zmcraster.open("warped.pyr") as raster:
            np.testing.assert_array_equal(raster.read(), warped.read())
            assert raster.transform == pytest.approx(tuple(warped.transform)[:6])
            assert raster.nodata == 3 and "WGS 84" in raster.crs


def test_a_dataset_in_memory(folder):
    array = samples("f4", (1, 300, 280))
    with rasterio.MemoryFile() as memory:
        with memory.open(driver="GTiff", width=280, height=300, count=1, dtype="float32", nodata=-1) as out:
            out.write(array)
        with memory.open() as dataset:
            zmcraster.build(dataset, "memory.pyr")
    with zmcraster.open("memory.pyr") as raster:
        np.testing.assert_array_equal(raster.read(), array)
        assert raster.nodata == -1


def test_each_chunk_is_computed_once(folder):
    computed = []
    lock = threading.Lock()

    def chunk(block_info=None):
        with lock:
            computed.append(tuple(block_info[None]["chunk-location"]))
        return np.full(block_info[None]["chunk-shape"], sum(computed[-1]), np.uint8)
    array = dask.array.map_blocks(chunk, chunks=((2,), (700, 600), (300, 300)), dtype=np.uint8,
                                  meta=np.empty((0, 0, 0), np.uint8))
    zmcraster.build(array, "chunks.pyr")
    assert sorted(computed) == [(0, row, column) for row in (0, 1) for column in (0, 1)]
    with zmcraster.open("chunks.pyr") as raster:
        assert raster.read(1)[::400, ::400].tolist() == [[0, 1], [0, 1], [1, 2], [1, 2]]


def test_progress(folder):
    seen = []
    zmcraster.build(samples("u1", (1000, 1000)), "done.pyr", progress=lambda done, total: seen.append((done, total)))
    assert seen and seen[-1][0] == seen[-1][1] and seen == sorted(seen)
    with pytest.raises(zmcraster.Cancelled):
        zmcraster.build(samples("u1", (1000, 1000)), "not.pyr", progress=lambda done, total: False)
    with pytest.raises(ZeroDivisionError):
        zmcraster.build(samples("u1", (1000, 1000)), "not.pyr", progress=lambda done, total: 1 // 0)
    assert os.listdir() == ["done.pyr"]


def test_a_signal_ends_a_build(folder):
    class Interrupted(Exception):
        pass

    def handler(*_):
        raise Interrupted

    before = signal.signal(signal.SIGUSR1, handler)
    try:
        def progress(done, total):
            os.kill(os.getpid(), signal.SIGUSR1)
            threading.Event().wait(0.2)
        with pytest.raises(Interrupted):
            zmcraster.build(samples("u1", (3, 3000, 3000)), "not.pyr", progress=progress)
    finally:
        signal.signal(signal.SIGUSR1, before)
    assert os.listdir() == []


def test_a_source_that_raises(folder):
    def broken(block):
        raise RuntimeError("a chunk is lost")
    array = dask.array.ones((600, 600), chunks=300, dtype=np.uint8).map_blocks(broken, dtype=np.uint8,
                                                                               meta=np.empty((0, 0), np.uint8))
    with pytest.raises(RuntimeError, match="a chunk is lost"):
        zmcraster.build(array, "not.pyr")
    lying = dask.array.ones((600, 600), chunks=300, dtype=np.uint8).map_blocks(
        lambda block: block[:7].astype(np.float32), dtype=np.uint8, meta=np.empty((0, 0), np.uint8))
    with pytest.raises(Exception):
        zmcraster.build(lying, "not.pyr")
    assert os.listdir() == []


def test_targets(folder):
    array = np.zeros((300, 300), np.uint8)
    zmcraster.build(array, "there.pyr")
    with pytest.raises(zmcraster.FileError, match="exists"):
        zmcraster.build(array + 1, "there.pyr")
    zmcraster.build(array + 1, "there.pyr", overwrite=True)
    with zmcraster.open("there.pyr") as raster:
        assert raster.read(1)[0, 0] == 1
    with pytest.raises(zmcraster.FileError):
        zmcraster.build(array, "no/such/folder.pyr")
    with pytest.raises(zmcraster.FileError):
        zmcraster.build("no_such_source.tif", "not.pyr")


@pytest.mark.parametrize("words", (
    dict(levels=-1), dict(levels=40), dict(levels="some"), dict(resampling="magic"), dict(weights="some"),
    dict(ordering="random"), dict(nodata=300), dict(nodata=0.5), dict(nodata="some"), dict(bands=[]), dict(bands=[2]),
    dict(bands=[0]), dict(bins=0), dict(memory="lots"), dict(threads=-1), dict(crs="no reference"), dict(crs=[]),
    dict(crs="/etc/passwd"), dict(transform=(1, 2)), dict(transform="abcdef"), dict(descriptions=("a", "b")),
    dict(alpha=2), dict(alpha=0), dict(palette=np.zeros((4, 3), np.uint8)), dict(palette=np.zeros(4, np.uint8))))
def test_options_that_fit_nothing_are_refused(folder, words):
    with pytest.raises((zmcraster.ArgumentError, zmcraster.FileError)) as refused:
        zmcraster.build(np.zeros((300, 300), np.uint8), "not.pyr", **words)
    assert len(str(refused.value).splitlines()) == 1
    assert os.listdir() == []


@pytest.mark.parametrize("source", (
    np.zeros(5, np.uint8), np.zeros((2, 2, 2, 2), np.uint8), np.zeros((0, 5), np.uint8), np.zeros((5, 5), bool),
    np.zeros((5, 5), "U3"), np.zeros((5, 5), object), np.zeros((5, 5), np.float16), np.zeros((5, 5), "M8[s]"), 7, None,
    "", {"a": 1}))
def test_sources_that_are_none_are_refused(folder, source):
    with pytest.raises((zmcraster.Error, TypeError)) as refused:
        zmcraster.build(source, "not.pyr")
    assert len(str(refused.value).splitlines()) == 1
    assert os.listdir() == []


def test_arrays_of_other_byte_order_and_views(folder):
    array = samples("u4", (3, 400, 500))
    zmcraster.build(array.astype(">u4"), "swapped.pyr")
    zmcraster.build(array[:, ::-1, ::-1], "turned.pyr")
    zmcraster.build(np.broadcast_to(np.uint32(7), (300, 300)), "same.pyr")
    with zmcraster.open("swapped.pyr") as raster:
        np.testing.assert_array_equal(raster.read(), array)
    with zmcraster.open("turned.pyr") as raster:
        np.testing.assert_array_equal(raster.read(), array[:, ::-1, ::-1])
    with zmcraster.open("same.pyr") as raster:
        assert (raster.read() == 7).all()


def test_what_is_embedded(folder):
    zmcraster.build(np.zeros((300, 300), np.uint8), "one.pyr", embed=True, nodata=3, **PLACE)
    assert os.listdir() == ["one.pyr"]
    with zmcraster.open("one.pyr") as raster:
        assert raster.nodata == 3 and raster.transform == PLACE["transform"]
