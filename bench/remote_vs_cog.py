#!/usr/bin/python3 -B
"""Reading over HTTP side by side with GDAL's own COG driver, uncompressed and DEFLATE.

Two rasters, each as a pyramid and as both kinds of COG: 16,384 x 12,288 pixels of three bytes, and
1,296,000 x 525,000 of one byte, of which nothing but the header, or the directories, is on disk. A
local server writes down each request, and waits before each answer. Prints, for opening, one tile,
a window of 1024 x 768, a screen of an overview and a full read, the requests (those that GDAL makes
before it has chosen a driver included), the bytes of all answers and the time with either delay;
and the same with GDAL_DISABLE_READDIR_ON_OPEN=EMPTY_DIR, without a search for files beside the raster.
Full reads are of the smaller raster alone.

    bench/remote_vs_cog.py [--scratch DIR] [--width N] [--delays 5,50]
"""
import argparse
import os
import sys
import tempfile
import time

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "tests", "gdal"))
import numpy as np  # noqa: E402
from osgeo import gdal  # noqa: E402

from build_vs_cog import make_source  # noqa: E402
from server import Server  # noqa: E402

gdal.UseExceptions()
SPARSE = (1296000, 525000)


def make_large(folder, width):
    height = width * 3 // 4
    source = os.path.join(folder, "source.tif")
    make_source(source, width, height)
    gdal.Translate(os.path.join(folder, "large.pyr"), source, format="ZMCPyramid")
    for name, compress in (("none", "NONE"), ("deflate", "DEFLATE")):
        gdal.Translate(os.path.join(folder, f"large_{name}.tif"), source, format="COG",
                       creationOptions=["COMPRESS=" + compress, "BIGTIFF=YES",
                                        "NUM_THREADS=ALL_CPUS"])
    os.remove(source)


def make_sparse(folder):
    """The pyramid is its header, at the length of its tiles; levels go on until one fits a tile. The
    COG driver would take hours to find that nothing is there, so the other files are made as it lays
    them out: tiles of 512 x 512, levels down to one tile, and no tile written."""
    width, height = SPARSE
    levels = 0
    while max(width >> levels, height >> levels) > 256:
        levels += 1
    small = os.path.join(folder, "small.pyr")
    gdal.GetDriverByName("ZMCPyramid").CreateCopy(
        small, gdal.GetDriverByName("MEM").Create("", 2, 2), options=["STATISTICS=NO"])
    with open(small, "rb") as stream:
        start = int.from_bytes(stream.read(12)[4:], "little")
        stream.seek(20)
        text = stream.read(start - 20).decode()
    os.remove(small)
    for name, old, new in (("PIXEL_HEIGHT", 2, height), ("PIXEL_WIDTH", 2, width),
                           ("LEVELMAX", 0, levels)):
        text = text.replace(f"<HEADER_{name}>{old}<", f"<HEADER_{name}>{new}<")
    start = 20 + len(text)
    end = start + sum((width >> level) * (height >> level) for level in range(levels + 1))
    with open(os.path.join(folder, "sparse.pyr"), "wb") as stream:
        stream.write(b"KOBT" + start.to_bytes(8, "little") + end.to_bytes(8, "little") +
                     text.encode())
        stream.truncate(end)
    gdal.SetConfigOption("SPARSE_OK_OVERVIEW", "YES")
    gdal.SetConfigOption("GDAL_TIFF_OVR_BLOCKSIZE", "512")
    for name, compress in (("none", "NONE"), ("deflate", "DEFLATE")):
        path = os.path.join(folder, f"sparse_{name}.tif")
        gdal.GetDriverByName("GTiff").Create(
            path, width, height, 1, gdal.GDT_Byte,
            ["TILED=YES", "BLOCKXSIZE=512", "BLOCKYSIZE=512", "SPARSE_OK=TRUE", "BIGTIFF=YES",
             "COMPRESS=" + compress])
        dataset = gdal.OpenEx(path, gdal.OF_UPDATE, open_options=["SPARSE_OK=TRUE"])
        dataset.BuildOverviews("NONE", [2 ** level for level in range(1, levels)])
        dataset = None


def steps(dataset_of, full):
    """The five things that are done, each on a dataset opened anew but the first."""
    yield "open", None
    width, height = dataset_of.RasterXSize, dataset_of.RasterYSize
    x, y = width // 2 // 256 * 256, height // 2 // 256 * 256
    yield "one tile", lambda dataset: dataset.GetRasterBand(1).ReadRaster(x, y, 256, 256)
    yield "window", lambda dataset: dataset.ReadRaster(x + 100, y + 100, 1024, 768)
    yield "overview", lambda dataset: dataset.ReadRaster(0, 0, width, height, 1024, 768)
    if full:
        def read_all(dataset):
            for top in range(0, height, 1024):
                dataset.ReadRaster(0, top, width, min(1024, height - top))
        yield "full read", read_all


def measure(server, name, work):
    """Requests, bytes and seconds of the opening, or of what is done behind it."""
    gdal.VSICurlClearCache()
    server.take()
    start = time.monotonic()
    dataset = gdal.Open(name)
    if work:
        server.take()
        start = time.monotonic()
        work(dataset)
    seconds = time.monotonic() - start
    requests = server.take()
    return len(requests), sum(request.sent for request in requests), seconds


def row(server, name, work, delays):
    times = []
    for delay in delays:
        server.delay = delay / 1000
        requests, sent, seconds = measure(server, name, work)
        times.append(f" {seconds:.3f} s |")
    return f" {requests} | {sent:,} |" + "".join(times)


def main():
    parser = argparse.ArgumentParser(description=__doc__.split("\n")[0])
    parser.add_argument("--scratch", default=None)
    parser.add_argument("--width", type=int, default=16384)
    parser.add_argument("--delays", default="5,50")
    arguments = parser.parse_args()
    with tempfile.TemporaryDirectory(dir=arguments.scratch) as folder:
        make_large(folder, arguments.width)
        make_sparse(folder)
        server = Server(folder)
        delays = [int(delay) for delay in arguments.delays.split(",")]
        columns = " requests | bytes |" + "".join(f" {delay} ms |" for delay in delays)
        print("| raster | step | file |" + columns + columns)
        print("|---|---|---|" + ("--:|--:|" + "--:|" * len(delays)) * 2)
        for raster, files in (
                (f"{arguments.width:,} x {arguments.width * 3 // 4:,} x 3",
                 ("large.pyr", "large_none.tif", "large_deflate.tif")),
                ("1,296,000 x 525,000, sparse",
                 ("sparse.pyr", "sparse_none.tif", "sparse_deflate.tif"))):
            full = files[0] == "large.pyr"
            plain = gdal.Open(os.path.join(folder, files[0]))
            for step, work in steps(plain, full):
                names = ["/vsicurl/" + server.url + name for name in files]
                labels = ["pyramid", "COG, raw", "COG, DEFLATE"]
                if not work:
                    names.insert(1, server.url + files[0])
                    labels.insert(1, "pyramid, plain URL")
                for name, label in zip(names, labels):
                    print(f"| {raster} | {step} | {label} |", end="")
                    for listing in ("FALSE", "EMPTY_DIR"):
                        gdal.SetConfigOption("GDAL_DISABLE_READDIR_ON_OPEN", listing)
                        print(row(server, name, work, delays), end="", flush=True)
                    print()
        server.stop()


if __name__ == "__main__":
    main()
