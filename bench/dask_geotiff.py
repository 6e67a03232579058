#!/usr/bin/python3 -B
"""What users of rioxarray and dask do of many scenes: a tiled GeoTIFF, written by the workers of a cluster, and its
overviews by GDAL behind it. The peer of zmcraster-dask in mosaic_bench.

    bench/dask_geotiff.py VRT TARGET WORKERS
"""
import sys

import distributed
import rioxarray
from osgeo import gdal

CHUNK = 4096
# As many as 40,000 x 30,000 pixels have until they fit one tile.
FACTORS = [2, 4, 8, 16, 32, 64, 128]


def main(source, target, workers):
    # They share the processors of one machine and its memory.
    with distributed.LocalCluster(n_workers=workers, threads_per_worker=1, dashboard_address=None) as cluster, \
            distributed.Client(cluster) as client:
        mosaic = rioxarray.open_rasterio(source, chunks={"x": CHUNK, "y": CHUNK}, lock=False)
        mosaic.rio.to_raster(target, tiled=True, blockxsize=256, blockysize=256, BIGTIFF="YES",
                             lock=distributed.Lock("target", client=client))
    gdal.UseExceptions()
    gdal.SetConfigOption("GDAL_NUM_THREADS", "ALL_CPUS")
    gdal.Open(target, gdal.GA_Update).BuildOverviews("AVERAGE", FACTORS)


if __name__ == "__main__":
    main(sys.argv[1], sys.argv[2], int(sys.argv[3]))
