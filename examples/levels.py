#!/usr/bin/python3
"""All levels of a pyramid file as one dictionary of arrays.

Usage: levels.py PYRAMID
"""
import sys

import numpy as np
from osgeo import gdal

gdal.UseExceptions()


def levels(name):
    """Level number to an array of bands, lines, samples; level 0 is the full raster."""
    dataset = gdal.Open(name)
    count = dataset.GetRasterBand(1).GetOverviewCount()
    pixels = dataset.ReadAsArray()
    result = {0: pixels if pixels.ndim == 3 else pixels[np.newaxis]}
    for level in range(1, count + 1):
        result[level] = np.stack([
            dataset.GetRasterBand(band + 1).GetOverview(level - 1).ReadAsArray()
            for band in range(dataset.RasterCount)])
    return result


if __name__ == "__main__":
    if len(sys.argv) != 2:
        sys.exit("usage: levels.py PYRAMID")
    for number, array in levels(sys.argv[1]).items():
        bands, height, width = array.shape
        print(f"level {number}: {width} x {height}, {bands} bands, {array.dtype}, "
              f"mean {array.mean(dtype='f8') if array.dtype.kind != 'c' else array.mean():.6g}")
