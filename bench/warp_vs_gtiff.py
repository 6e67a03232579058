#!/usr/bin/python3 -B
"""Writing pyramids by gdalwarp side by side with GDAL's GeoTIFF, on the same source and disk.

Source: a GeoTIFF of 4096 x 4096 pixels of three bytes, in tiles. It is enlarged or copied to the
same size (`-ts`), or brought into another coordinate system, by the nearest pixel. The pyramid has
all its levels, statistics and histograms, and has reached the disk when the program ends; the
GeoTIFF has none of that, but where the line says so. Prints the shortest time of each, and how many
times that of the first line it is; the programs take turns.

    bench/warp_vs_gtiff.py [--plugins build/release/gdalplugins] [--scratch DIR] [--repeat N]
"""
import argparse
import os
import subprocess
import sys
import time

from build_vs_cog import make_source, run, warm

SIDE = 4096
TIFF = ["-of", "GTiff"]
TILED = TIFF + ["-co", "TILED=YES"]
OURS = ["-of", "ZMCPyramid"]
PLAIN = OURS + ["-co", "LEVELS=0", "-co", "STATISTICS=NO"]
LEVELS = ["gdaladdo", "-q", "-r", "average"]
COMMANDS = (
    ("GTiff, tiled", TILED, None),
    ("GTiff, strips", TIFF, None),
    ("GTiff, tiled, flushed", TILED, ["sync"]),
    ("GTiff, tiled, levels by gdaladdo", TILED, LEVELS),
    ("pyramid", OURS, None),
    ("pyramid without statistics", OURS + ["-co", "STATISTICS=NO"], None),
    ("pyramid of level 0 alone", PLAIN, None),
)


def placed(path):
    """The same pixels with a georeference, so that they can be brought elsewhere."""
    target = path.replace(".tif", "-placed.tif")
    if not os.path.exists(target):
        subprocess.run(["gdal_translate", "-q", "-co", "TILED=YES", "-co", "INTERLEAVE=PIXEL",
                        "-a_srs", "EPSG:4326", "-a_ullr", "10", "52", "14", "48", path, target],
                       check=True)
    return target


def once(warp, target, then):
    """Seconds of one run, of the second program too if there is one."""
    for ending in ("", ".aux.xml", ".ovr"):
        if os.path.exists(target + ending):
            os.remove(target + ending)
    subprocess.run(["sync"], check=True)
    begin = time.monotonic()
    run(warp + [target])
    if then:
        run(then + [target] + (["2", "4", "8", "16"] if then is LEVELS else []))
    return time.monotonic() - begin


def measure(title, source, how, folder, repeat):
    print(title)
    times = {name: [] for name, _, _ in COMMANDS}
    for _ in range(repeat):
        for name, output, then in COMMANDS:
            warp = ["gdalwarp", "-q", "-r", "near", *how, *output, source]
            times[name].append(once(warp, os.path.join(folder, "target"), then))
    base = min(times[COMMANDS[0][0]])
    for name, seconds in times.items():
        middle = sorted(seconds)[len(seconds) // 2]
        print(f"  {name:34} {min(seconds):7.3f} s  {min(seconds) / base:5.2f}   "
              f"median {middle:7.3f} s  {middle / sorted(times[COMMANDS[0][0]])[repeat // 2]:5.2f}")


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    root = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
    parser.add_argument("--plugins", default=os.path.join(root, "build/release/gdalplugins"))
    parser.add_argument("--scratch", default="/tmp/zmc-bench")
    parser.add_argument("--repeat", type=int, default=5)
    options = parser.parse_args()
    os.makedirs(options.scratch, exist_ok=True)
    os.environ["GDAL_DRIVER_PATH"] = options.plugins
    source = os.path.join(options.scratch, f"source-{SIDE}x{SIDE}.tif")
    if not os.path.exists(source):
        make_source(source, SIDE, SIDE)
    source = placed(source)
    warm(source)
    measure("to the same size", source, ["-ts", str(SIDE), str(SIDE)], options.scratch,
            options.repeat)
    measure("to UTM", source, ["-t_srs", "EPSG:32633", "-ts", str(SIDE), str(SIDE)],
            options.scratch, options.repeat)


if __name__ == "__main__":
    sys.exit(main())
