"""Rasters that are read from file objects and from servers."""
import functools
import http.server
import io
import os
import re
import threading

import numpy as np
import pytest

import zmcraster


class Unsteady(io.RawIOBase):
    """A file whose reads go wrong in a chosen way, from some call on."""

    def __init__(self, content, how, after=0):
        super().__init__()
        self.content, self.how, self.after, self.place, self.calls = content, how, after, 0, 0

    def seek(self, offset, whence=0):
        self.place = offset + (0, self.place, len(self.content))[whence]
        return None if self.how == "silent" else self.place

    def tell(self):
        return self.place

    def read(self, size=-1):
        self.calls += 1
        part = self.content[self.place:self.place + size]
        if self.calls > self.after:
            if self.how == "raises":
                raise ConnectionResetError("the line is dead")
            if self.how == "interrupted":
                raise KeyboardInterrupt
            if self.how == "long":
                return part + b"more"
            if self.how == "text":
                return "text"
            if self.how == "none":
                return None
            if self.how == "ends":
                return b""
            if self.how == "short":
                part = part[:max(1, size // 3)]
        self.place += len(part)
        return part


@pytest.fixture(scope="module")
def content(scene_file):
    with open(scene_file, "rb") as file:
        return file.read()


def test_file_objects(scene_file, scene_array, content):
    with open(scene_file, "rb") as buffered, open(scene_file, "rb", buffering=0) as raw:
        for file in (buffered, raw, io.BytesIO(content), Unsteady(content, "short"), Unsteady(content, "silent")):
            with zmcraster.open(file) as raster:
                np.testing.assert_array_equal(raster.read(), scene_array)
                assert raster.statistics(1).maximum == 255
                # What stands beside the file is no matter of the object's.
                assert raster.crs is None and raster.nodata is None
            assert not file.closed


def test_an_object_with_all_in_it(folder, scene_array):
    zmcraster.build(scene_array, "embedded.pyr", embed=True, crs=4326, nodata=9)
    with open("embedded.pyr", "rb") as file, zmcraster.open(file) as raster:
        assert "WGS 84" in raster.crs and raster.nodata == 9
        np.testing.assert_array_equal(raster.read(1, masked=True).mask, scene_array[0] == 9)


@pytest.mark.parametrize("how", ("raises", "long", "text", "none", "ends"))
def test_what_goes_wrong_becomes_an_exception(content, how):
    with pytest.raises(zmcraster.FileError) as refused:
        zmcraster.open(Unsteady(content, how))
    assert len(str(refused.value).splitlines()) == 1
    calls = Unsteady(content, "", 0)
    with zmcraster.open(calls) as raster:
        raster.read(1, window=(0, 0, 1, 1))
    file = Unsteady(content, how, after=calls.calls)
    with zmcraster.open(file) as raster:
        raster.read(1, window=(0, 0, 1, 1))
        for _ in range(2):
            with pytest.raises(zmcraster.FileError) as failed:
                raster.read(1, window=(300, 300, 300, 300))
            assert len(str(failed.value).splitlines()) == 1
            if how == "raises":
                assert isinstance(failed.value.__cause__, ConnectionResetError)
        file.how = ""
        np.testing.assert_array_equal(raster.read(1, window=(300, 300, 300, 300)),
                                      zmcraster.open(io.BytesIO(content)).read(1, window=(300, 300, 300, 300)))


def test_an_interruption_stays_one(content):
    with pytest.raises(KeyboardInterrupt):
        zmcraster.open(Unsteady(content, "interrupted"))


def test_an_object_that_lies_about_its_size(content):
    class Longer(io.BytesIO):
        def seek(self, offset, whence=0):
            place = super().seek(offset, whence)
            return place + 10**6 if whence == 2 else place

    class Negative(io.BytesIO):
        def seek(self, offset, whence=0):
            place = super().seek(offset, whence)
            return -1 if whence == 2 else place

    cut = content[:len(content) // 2]
    with zmcraster.open(Longer(cut)) as raster, pytest.raises(zmcraster.FileError):
        raster.read()
    with pytest.raises(zmcraster.FileError):
        zmcraster.open(Negative(content))


def test_an_object_that_reads_the_raster_which_is_made_of_it(content):
    class Circle(io.BytesIO):
        raster = None

        def read(self, size=-1):
            if self.raster is not None:
                self.raster.read()
            return super().read(size)

    file = Circle(content)
    with zmcraster.open(file) as raster:
        file.raster = raster
        with pytest.raises(zmcraster.FileError):
            raster.read()
        file.raster = None
        assert raster.read(1).shape == (600, 700)


def test_threads_read_one_object(content, scene_array):
    wrong = []
    with zmcraster.open(io.BytesIO(content), threads=2) as raster:
        def work(column):
            for row in range(0, 600, 50):
                part = raster.read(window=(column, row, 70, 50))
                if not (part == scene_array[:, row:row + 50, column:column + 70]).all():
                    wrong.append((row, column))
        threads = [threading.Thread(target=work, args=(column,)) for column in range(0, 700, 100)]
        for thread in threads:
            thread.start()
        for thread in threads:
            thread.join()
        np.testing.assert_array_equal(raster.read(), scene_array)
    assert not wrong


def test_objects_that_are_no_files(content):
    for wrong in (io.StringIO("text"), object(), 3.5):
        with pytest.raises((zmcraster.Error, TypeError)):
            zmcraster.open(wrong)
    with pytest.raises(zmcraster.ArgumentError):
        zmcraster.open(io.BytesIO(content), "r+")


class Ranges(http.server.SimpleHTTPRequestHandler):
    protocol_version = "HTTP/1.1"

    def log_message(self, *_):
        pass

    def send_head(self):
        asked = re.fullmatch(r"bytes=(\d+)-(\d+)", self.headers.get("Range", ""))
        path = self.translate_path(self.path)
        if not asked or not os.path.isfile(path):
            return super().send_head()
        size = os.path.getsize(path)
        first, last = int(asked[1]), min(int(asked[2]), size - 1)
        with open(path, "rb") as file:
            file.seek(first)
            part = file.read(last - first + 1)
        self.send_response(206)
        self.send_header("Content-Range", f"bytes {first}-{last}/{size}")
        self.send_header("Content-Length", str(len(part)))
        self.end_headers()
        return io.BytesIO(part)


@pytest.fixture
def server(scene_file):
    handler = functools.partial(Ranges, directory=os.path.dirname(scene_file))
    with http.server.ThreadingHTTPServer(("127.0.0.1", 0), handler) as running:
        thread = threading.Thread(target=running.serve_forever)
        thread.start()
        yield f"http://127.0.0.1:{running.server_port}"
        running.shutdown()
        thread.join()


def test_urls(server, scene_array):
    with zmcraster.open(server + "/scene.pyr") as raster:
        np.testing.assert_array_equal(raster.read(), scene_array)
        np.testing.assert_array_equal(raster.read(2, level=0, window=(1, 2, 3, 4)), scene_array[1, 2:6, 1:4])
        assert raster.nodata == 9 and raster.statistics(2).maximum == 255
        np.testing.assert_array_equal(raster.read(1, masked=True).mask, scene_array[0] == 9)
    with pytest.raises(zmcraster.FileError) as refused:
        zmcraster.open(server + "/nothing.pyr")
    assert len(str(refused.value).splitlines()) == 1
    with pytest.raises(zmcraster.ArgumentError):
        zmcraster.open(server + "/scene.pyr", "r+")
