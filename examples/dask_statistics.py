#!/usr/bin/python3
"""Statistics and a normalised index of a pyramid file, on several worker processes.

Usage: dask_statistics.py PYRAMID [--level N] [--workers N]

The file is opened by rioxarray through the GDAL driver, in chunks of whole tiles. Each worker opens
it for itself. Minimum and maximum of level 0 agree with the archive of the file to the last bit,
mean and standard deviation within rounding; the archive's own figures are printed beside.
"""
import argparse
import warnings

import dask
import numpy as np
import rioxarray
from dask.distributed import Client, LocalCluster
from osgeo import gdal
from rasterio.errors import NotGeoreferencedWarning

gdal.UseExceptions()

TILE = 256


def need_no_place():
    """Statistics do not ask where on earth a picture lies; many do not know it."""
    warnings.filterwarnings("ignore", category=NotGeoreferencedWarning)


def open_level(name, level):
    options = {} if level == 0 else {"overview_level": level - 1}
    return rioxarray.open_rasterio(
        name, chunks={"x": 2 * TILE, "y": 2 * TILE}, lock=False, masked=True, **options)


def archived(name):
    """What the file's archive says of each band, without looking at a pixel."""
    dataset = gdal.Open(name)
    bands = []
    for number in range(1, dataset.RasterCount + 1):
        metadata = dataset.GetRasterBand(number).GetMetadata()
        bands.append({key: float(metadata["STATISTICS_" + key.upper()])
                      for key in ("minimum", "maximum", "mean", "stddev")})
    return bands


def statistics(raster):
    values = raster.data.astype("f8")
    axes = (1, 2)
    return dask.compute(values.min(axis=axes), values.max(axis=axes), values.mean(axis=axes),
                        values.std(axis=axes))


def normalised_index(raster):
    """(a - b) / (a + b) of the first two bands; its mean, and the share of it above zero."""
    a, b = raster.data[0].astype("f8"), raster.data[1].astype("f8")
    total = a + b
    index = dask.array.where(total == 0, np.nan, (a - b) / dask.array.where(total == 0, 1, total))
    return dask.compute(dask.array.nanmean(index), dask.array.nanmean(index > 0))


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("pyramid")
    parser.add_argument("--level", type=int, default=0)
    parser.add_argument("--workers", type=int, default=2)
    arguments = parser.parse_args()
    cluster = LocalCluster(n_workers=arguments.workers, threads_per_worker=1,
                           dashboard_address=None)
    need_no_place()
    with cluster, Client(cluster) as client:
        client.run(need_no_place)
        raster = open_level(arguments.pyramid, arguments.level)
        print(f"level {arguments.level}: {raster.sizes['x']} x {raster.sizes['y']}, "
              f"{raster.sizes['band']} bands, {raster.data.npartitions} chunks, "
              f"{len(client.scheduler_info()['workers'])} workers")
        minimum, maximum, mean, deviation = statistics(raster)
        stored = archived(arguments.pyramid)
        for band in range(raster.sizes["band"]):
            print(f"band {band + 1}: minimum {minimum[band]:.17g} maximum {maximum[band]:.17g} "
                  f"mean {mean[band]:.12g} deviation {deviation[band]:.12g}")
            print("  stored: minimum {minimum:.17g} maximum {maximum:.17g} mean {mean:.12g} "
                  "deviation {stddev:.12g}".format(**stored[band]))
        if raster.sizes["band"] > 1:
            level, share = normalised_index(raster)
            print(f"index of bands 1 and 2: mean {level:.12g}, above zero {share:.6f}")


if __name__ == "__main__":
    main()
