"""Rasters that are read."""
import pickle
import threading

import numpy as np
import pytest
from osgeo import gdal

import zmcraster
from conftest import TYPES, run_tool, samples
from pyramid import Pyramid

gdal.UseExceptions()


@pytest.mark.parametrize("ordering", ("scanline", "blocked", "morton"))
@pytest.mark.parametrize("dtype", TYPES)
def test_every_type_and_ordering_reads_as_the_format_tells(folder, dtype, ordering):
    bands = 9 if ordering == "morton" else 2
    array = samples(dtype, (bands, 300, 531))
    zmcraster.build(array, "one.pyr", ordering="auto" if bands > 8 else ordering)
    stored = Pyramid("one.pyr")
    with zmcraster.open("one.pyr") as raster:
        assert (raster.dtype, raster.shape) == (np.dtype(dtype), array.shape)
        assert raster.ordering.lower() == ordering
        assert [level.number for level in raster.levels] == list(range(stored.level_max + 1))
        np.testing.assert_array_equal(raster.read(), array)
        for level in range(stored.level_max + 1):
            np.testing.assert_array_equal(raster.read(level=level), np.moveaxis(stored.read(level), 2, 0))
        np.testing.assert_array_equal(raster.read([2, 1], window=(250, 199, 270, 70)),
                                      array[[1, 0], 199:269, 250:520])
        np.testing.assert_array_equal(raster.read(2, window=(256, 0, 256, 256)), array[1, :256, 256:512])


def test_what_is_told(scene_file):
    with zmcraster.open(scene_file) as raster:
        assert raster.shape == (3, 600, 700)
        assert raster.transform == (30, 0, 500000, 0, -30, 4000000)
        assert "UTM zone 31N" in raster.crs
        assert raster.nodatavals == (9, 9, 9) and isinstance(raster.nodata, int)
        assert raster.descriptions == ("red", "green", "blue")
        assert raster.metadata["SENSOR"] == "made up"
        assert raster.tile == 256 and raster.complete and raster.mode == "r"
        assert raster.levels[1] == (1, 350, 300)
        assert raster.transform_of(2)[:3] == (120, 0, 500000)
        assert "700 x 600" in repr(raster)


def test_records_are_those_of_the_command_line(scene_file, scene_array):
    import json
    told = json.loads(run_tool("info", "--json", scene_file))
    with zmcraster.open(scene_file) as raster:
        for band in (1, 2, 3):
            statistics = raster.statistics(band)
            expected = told["statistics"][band - 1]
            assert (statistics.minimum, statistics.maximum) == (expected["minimum"], expected["maximum"])
            assert statistics.mean == pytest.approx(expected["mean"], rel=1e-14)
            assert statistics.standard_deviation == pytest.approx(expected["standardDeviation"], rel=1e-14)
            counts, edges = raster.histogram(band)
            assert counts.tolist() == told["histograms"][band - 1]["counts"]
            valid = scene_array[band - 1][scene_array[band - 1] != 9]
            np.testing.assert_array_equal(counts, np.histogram(valid, edges)[0])
        assert raster.palette() is None


def test_palettes(folder):
    colors = np.array([[0, 0, 0, 0], [255, 0, 0, 255], [1, 2, 3, 4]], np.uint8)
    zmcraster.build(np.ones((300, 300), np.uint8), "palette.pyr", palette=colors)
    with zmcraster.open("palette.pyr") as raster:
        np.testing.assert_array_equal(raster.palette(), colors)
        assert raster.interpretations == ("Palette",)
    assert gdal.Open("palette.pyr").GetRasterBand(1).GetColorTable().GetColorEntry(2) == (1, 2, 3, 4)


def test_masks(scene_file, scene_array):
    with zmcraster.open(scene_file) as raster:
        masked = raster.read(masked=True)
        np.testing.assert_array_equal(masked.mask, scene_array == 9)
        assert masked.fill_value == 9
        out = np.empty((50, 60), np.uint8)
        one = raster.read(2, window=(40, 90, 60, 50), masked=True, out=out)
        assert np.shares_memory(one, out)
        np.testing.assert_array_equal(one.mask, scene_array[1, 90:140, 40:100] == 9)
        coarse = raster.read(level=1, masked=True)
        np.testing.assert_array_equal(coarse.mask, coarse.data == 9)


def test_a_raster_without_masks_has_none(folder):
    zmcraster.build(np.zeros((10, 10), np.int32), "plain.pyr")
    with zmcraster.open("plain.pyr") as raster:
        assert raster.read(masked=True).mask is np.ma.nomask
        assert raster.nodata is None and raster.crs is None and raster.transform is None


@pytest.mark.parametrize("dtype", ("i1", "i8", "u8", "f4"))
def test_masks_of_types_that_are_hard_to_show(folder, dtype):
    array = samples(dtype, (2, 300, 300))
    marked = {"i1": -100, "i8": -2**63, "u8": 2**63, "f4": -1.5}[dtype]
    array[0, 5, 7] = marked
    if dtype == "f4":
        array[1, 6, 8] = np.nan
    zmcraster.build(array, "marked.pyr", nodata=marked)
    with zmcraster.open("marked.pyr") as raster:
        assert raster.nodata == marked
        masked = raster.read(masked=True)
        expected = array == np.dtype(dtype).type(marked)
        if dtype == "f4":
            expected |= np.isnan(array)
        np.testing.assert_array_equal(masked.mask, expected)
        np.testing.assert_array_equal(masked.data, array)


def test_alpha_hides(folder):
    array = samples("u1", (4, 300, 300))
    array[3, :150] = 0
    zmcraster.build(array, "alpha.pyr", alpha=4)
    with zmcraster.open("alpha.pyr") as raster:
        assert raster.interpretations[3] == "Alpha"
        np.testing.assert_array_equal(raster.read(1, masked=True).mask, array[3] == 0)


def test_arrays_to_fill(scene_file, scene_array):
    with zmcraster.open(scene_file) as raster:
        big = np.zeros((8, 700, 3, 1300), np.uint8)
        for view in (np.empty((3, 600, 700), np.uint8), big[2:8:2, 600:0:-1, 1, 1299:599:-1],
                     np.empty((600, 700, 3), np.uint8).transpose(2, 0, 1)):
            assert raster.read(out=view) is view
            np.testing.assert_array_equal(view, scene_array)
        row = np.empty((1, 1, 700), np.uint8)
        np.testing.assert_array_equal(raster.read([2], window=(0, 3, 700, 1), out=row), scene_array[1:2, 3:4])
        column = np.empty((600, 1), np.uint8)
        np.testing.assert_array_equal(raster.read(1, window=(9, 0, 1, 600), out=column), scene_array[0, :, 9:10])
        assert big[:, :, 0].sum() == 0 and big[:, :, 2].sum() == 0


@pytest.mark.parametrize("wrong", (
    dict(window=(0, 0, 0, 5)), dict(window=(-1, 0, 5, 5)), dict(window=(0, 0, 701, 1)), dict(window=(699, 599, 2, 1)),
    dict(window=(0, 0, 2**40, 1)), dict(window=(0, 0, 1)), dict(window=7), dict(window="abcd"),
    dict(window=(0.5, 0, 1, 1)), dict(window=(slice(0, 10, 2), slice(0, 10))), dict(window=(slice(5, 2), slice(0, 9))),
    dict(window=(slice(-5, None), slice(0, 9))), dict(level=3), dict(level=-1), dict(level="0"), dict(level=2**40),
    dict(bands=0), dict(bands=4), dict(bands=-1), dict(bands=[]), dict(bands="1"), dict(bands=1.5),
    dict(out=np.empty((3, 600, 700), np.int8)), dict(out=np.empty((3, 600, 701), np.uint8)),
    dict(out=np.empty((600, 700), np.uint8)), dict(out=np.broadcast_to(np.uint8(0), (3, 600, 700))), dict(out=[1]),
    dict(out=np.lib.stride_tricks.as_strided(np.empty(9, np.uint8), (3, 600, 700), (0, 0, 0))),
    dict(level=1, window=(0, 0, 700, 600))))
def test_arguments_that_fit_nothing_are_refused(scene_file, wrong):
    with zmcraster.open(scene_file) as raster:
        with pytest.raises(zmcraster.ArgumentError) as refused:
            raster.read(**wrong)
        assert isinstance(refused.value, ValueError) and isinstance(refused.value, zmcraster.Error)
        assert len(str(refused.value).splitlines()) == 1


def test_the_extension_itself_is_safe(scene_file):
    from zmcraster import _zmcraster
    file = _zmcraster.open(scene_file, False, True, "", 1, False)
    area = _zmcraster.Area(0, 0, 10, 10)
    for wrong in (dict(level=9), dict(bands=[0]), dict(bands=[]), dict(area=_zmcraster.Area(695, 0, 10, 10)),
                  dict(area=_zmcraster.Area(2**32 - 1, 2**32 - 1, 2**32 - 1, 2**32 - 1)),
                  dict(out=np.empty((1, 10, 9), np.uint8)), dict(out=np.empty((1, 10, 10), np.uint16))):
        with pytest.raises(zmcraster.ArgumentError):
            file.read(**{**dict(level=0, area=area, bands=[1]), **wrong})
    with pytest.raises(zmcraster.FileError):
        file.write(area, [1], np.zeros((1, 10, 10), np.uint8))
    file.close()
    with pytest.raises(zmcraster.ArgumentError):
        file.read(0, area, [1])
    for call in (file.facts, lambda: file.statistics(1), lambda: file.width):
        with pytest.raises(zmcraster.ArgumentError):
            call()


def test_windows_of_other_libraries(scene_file, scene_array):
    from rasterio.windows import Window
    with zmcraster.open(scene_file) as raster:
        np.testing.assert_array_equal(raster.read(1, window=Window(3, 4, 50, 60)), scene_array[0, 4:64, 3:53])
        np.testing.assert_array_equal(raster.read(1, window=(slice(4, None), slice(None, 9))), scene_array[0, 4:, :9])


def test_closed(scene_file):
    raster = zmcraster.open(scene_file)
    raster.close()
    raster.close()
    assert raster.closed and "closed" in repr(raster)
    for call in (raster.read, lambda: raster.crs, lambda: raster.statistics(1),
                 lambda: raster.write(np.zeros((3, 600, 700), np.uint8))):
        with pytest.raises(zmcraster.ArgumentError, match="closed"):
            call()


def test_files_that_are_none(folder):
    with pytest.raises(FileNotFoundError):
        zmcraster.open("nothing.pyr")
    (folder / "text.pyr").write_text("no pyramid")
    for name in ("text.pyr", str(folder), "/vsimem/nothing", "MEM:::DATAPOINTER=1"):
        with pytest.raises(zmcraster.FileError) as refused:
            zmcraster.open(name)
        assert isinstance(refused.value, OSError) and len(str(refused.value).splitlines()) == 1
    for name in ("", "a\0b", "\udc80.pyr"):
        with pytest.raises(zmcraster.ArgumentError):
            zmcraster.open(name)
    for wrong in (b"bytes", 7, None):
        with pytest.raises(TypeError):
            zmcraster.open(wrong)
    for words in (dict(mode="w"), dict(threads=0), dict(threads="many"), dict(missing="zero")):
        with pytest.raises(zmcraster.ArgumentError):
            zmcraster.open("text.pyr", **words)


def test_an_incomplete_file_is_read_as_far_as_it_goes(folder, scene_file, scene_array):
    with open(scene_file, "rb") as whole:
        content = whole.read()
    (folder / "cut.pyr").write_bytes(content[:len(content) // 2])
    with zmcraster.open("cut.pyr") as raster:
        assert not raster.complete
        np.testing.assert_array_equal(raster.read(window=(0, 0, 256, 100)), scene_array[:, :100, :256])
        with pytest.raises(zmcraster.FileError):
            raster.read()
    with zmcraster.open("cut.pyr", missing="zeros") as raster:
        assert raster.read()[:, -1, -1].tolist() == [0, 0, 0]


def test_memory_is_not_taken_for_what_a_file_only_claims(folder):
    zmcraster.build(np.zeros((256, 256), np.uint8), "small.pyr", levels=0)
    content = (folder / "small.pyr").read_bytes()
    start = int.from_bytes(content[4:12], "little")
    header = content[20:start]
    for name in (b"WIDTH", b"HEIGHT"):
        header = header.replace(b"_%s>256<" % name, b"_%s>2000000<" % name)
    assert len(header) == start - 20 + 8
    (folder / "claims.pyr").write_bytes(content[:4] + (start + 8).to_bytes(8, "little") + content[12:20] + header +
                                        content[start:])
    with zmcraster.open("claims.pyr") as raster:
        assert raster.width == 2000000
        with pytest.raises(zmcraster.FileError):
            raster.read(1)


def test_many_threads_read_one_raster(scene_file, scene_array):
    wrong = []
    with zmcraster.open(scene_file) as raster:
        def work(seed):
            random = np.random.default_rng(seed)
            for _ in range(60):
                x, y = int(random.integers(0, 600)), int(random.integers(0, 500))
                part = raster.read(window=(x, y, 90, 80), masked=bool(seed % 2))
                if not (np.asarray(part) == scene_array[:, y:y + 80, x:x + 90]).all():
                    wrong.append((x, y))
                raster.statistics(1 + seed % 3)
        threads = [threading.Thread(target=work, args=(seed,)) for seed in range(8)]
        for thread in threads:
            thread.start()
        for thread in threads:
            thread.join()
    assert not wrong


def test_closing_while_threads_read(scene_file):
    for _ in range(10):
        raster = zmcraster.open(scene_file)
        ended = []

        def work():
            try:
                while True:
                    raster.read(masked=True)
            except zmcraster.ArgumentError:
                ended.append(True)
        threads = [threading.Thread(target=work) for _ in range(3)]
        for thread in threads:
            thread.start()
        raster.close()
        for thread in threads:
            thread.join(20)
        assert len(ended) == 3


def test_large_windows_by_several_threads(folder):
    array = samples("u2", (2, 1500, 1600))
    zmcraster.build(array, "large.pyr")
    with zmcraster.open("large.pyr", threads=3) as raster:
        np.testing.assert_array_equal(raster.read(), array)


def test_python_runs_while_pixels_are_read(folder):
    """A thread that reads all the time lets another one count."""
    zmcraster.build(samples("u1", (3, 3000, 3000)), "big.pyr", no_statistics=True)
    with zmcraster.open("big.pyr") as raster:
        out = np.empty((3, 3000, 3000), np.uint8)
        done = threading.Event()
        counted = []

        def count():
            while not done.is_set():
                counted.append(None)
                done.wait(0.0001)
        counter = threading.Thread(target=count)
        counter.start()
        # On a machine that is busy with other things the counter may get no processor for a while; of a read
        # that kept Python to itself it would see the end alone.
        during = 0
        for _ in range(50):
            before = len(counted)
            raster.read(out=out)
            during = max(during, len(counted) - before)
            if during > 2:
                break
        done.set()
        counter.join()
    assert during > 2


def test_rasters_travel_to_other_processes(scene_file, scene_array):
    with zmcraster.open(scene_file) as raster:
        with pickle.loads(pickle.dumps(raster)) as again:
            np.testing.assert_array_equal(again.read(1), scene_array[0])
    with open(scene_file, "rb") as file, zmcraster.open(file) as raster, pytest.raises(TypeError):
        pickle.dumps(raster)


def test_gdal_sees_the_same(scene_file, scene_array):
    import rasterio
    with rasterio.open(scene_file) as other, zmcraster.open(scene_file) as raster:
        np.testing.assert_array_equal(raster.read(), other.read())
        assert tuple(other.transform)[:6] == raster.transform
        assert rasterio.crs.CRS.from_wkt(raster.crs) == other.crs
        np.testing.assert_array_equal(raster.read(masked=True).mask, other.read(masked=True).mask)
