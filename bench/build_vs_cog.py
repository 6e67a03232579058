#!/usr/bin/python3 -B
"""Building pyramids side by side with GDAL's own COG builder, on the same source and disk.

Source: 16,384 x 12,288 pixels of three bytes, from a true-colour picture enlarged, with
deterministic noise. Both sides use two threads and average the levels; the pyramid has six levels
and statistics. Prints both times, their ratio, the peak memory of each, and how the pyramid's cost
grows with 1, 4 and 16 times the pixels.

    bench/build_vs_cog.py [--tool build/release/tools/zmcraster] [--scratch DIR] [--repeat N]
"""
import argparse
import os
import resource
import subprocess
import sys
import time

PICTURE = "/usr/share/xplanet/images/earth.jpg"
THREADS = "2"


def make_source(path, width, height):
    """The picture enlarged without smoothing, with a little noise that is the same every time."""
    import numpy as np
    from osgeo import gdal
    picture = gdal.Open(PICTURE).ReadAsArray()
    columns = np.arange(width) * picture.shape[2] // width
    random = np.random.default_rng(1)
    unfinished = path + ".part"
    target = gdal.GetDriverByName("GTiff").Create(
        unfinished, width, height, 3, gdal.GDT_Byte, ["TILED=YES", "INTERLEAVE=PIXEL", "BIGTIFF=YES"])
    step = 256
    for start in range(0, height, step):
        rows = np.arange(start, min(start + step, height)) * picture.shape[1] // height
        part = picture[:, rows][:, :, columns].astype(np.int16)
        part += random.integers(-8, 9, part.shape, dtype=np.int16)
        target.WriteArray(np.clip(part, 0, 255).astype(np.uint8), 0, start)
    del target
    os.rename(unfinished, path)


def run(command):
    """Seconds and peak memory in MiB of a command that must succeed."""
    start = time.monotonic()
    child = subprocess.Popen(command, stdout=subprocess.DEVNULL)
    _, status, usage = os.wait4(child.pid, 0)
    seconds = time.monotonic() - start
    child.returncode = os.waitstatus_to_exitcode(status)
    if child.returncode != 0:
        sys.exit(f"{command[0]} failed with status {child.returncode}")
    return seconds, usage.ru_maxrss / 1024


def warm(path):
    with open(path, "rb") as file:
        while file.read(1 << 20):
            pass


def cog(source, target, resampling="AVERAGE"):
    return ["gdal_translate", "-q", "-of", "COG", "-co", "COMPRESS=NONE", "-co",
            f"OVERVIEW_RESAMPLING={resampling}", "-co", f"NUM_THREADS={THREADS}", "-co", "BIGTIFF=YES",
            "--config", "GDAL_NUM_THREADS", THREADS, source, target]


def best(command, target, repeat):
    results = []
    for _ in range(repeat):
        if os.path.exists(target):
            os.remove(target)
        results.append(run(command))
    os.remove(target)
    return min(seconds for seconds, _ in results), max(memory for _, memory in results)


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    root = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
    parser.add_argument("--tool", default=os.path.join(root, "build/release/tools/zmcraster"))
    parser.add_argument("--scratch", default="/tmp/zmc-bench")
    parser.add_argument("--repeat", type=int, default=3)
    parser.add_argument("--wide", action="store_true",
                        help="also a raster four times as wide, for the peak memory")
    parser.add_argument("--make", nargs=3, help=argparse.SUPPRESS)
    options = parser.parse_args()
    if options.make:
        make_source(options.make[0], int(options.make[1]), int(options.make[2]))
        return
    os.makedirs(options.scratch, exist_ok=True)

    def build(source, target, levels):
        return [options.tool, "build", source, target, "--levels", str(levels), "--resampling",
                "average", "--threads", THREADS, "--quiet"]

    def source_of(width, height):
        path = os.path.join(options.scratch, f"source-{width}x{height}.tif")
        if not os.path.exists(path):
            # In a process of its own: what this one holds counts as the peak of its children.
            subprocess.run([sys.executable, __file__, "--make", path, str(width), str(height)],
                           check=True)
        warm(path)
        return path

    pyramid = os.path.join(options.scratch, "target.pyr")
    tiff = os.path.join(options.scratch, "target.tif")
    source = source_of(16384, 12288)
    ours, our_memory = best(build(source, pyramid, 6), pyramid, options.repeat)
    theirs, their_memory = best(cog(source, tiff), tiff, options.repeat)
    print(f"COG of GDAL      {theirs:8.2f} s  {their_memory:6.0f} MiB")
    print(f"zmcraster build  {ours:8.2f} s  {our_memory:6.0f} MiB")
    print(f"ratio            {theirs / ours:8.2f}")

    # Starting takes the same time whatever the raster is; growth is that of the rest.
    start, _ = best(build(source_of(64, 64), pyramid, 0), pyramid, 5)
    print(f"start            {start:8.2f} s")
    base = None
    for factor, width, height in ((1, 4096, 3072), (4, 8192, 6144), (16, 16384, 12288)):
        seconds, memory = best(build(source_of(width, height), pyramid, 6), pyramid,
                               options.repeat)
        per_pixel = (seconds - start) / (width * height) * 1e9
        base = base or per_pixel
        print(f"{factor:3} x: {width} x {height}  {seconds:7.2f} s  {memory:5.0f} MiB  "
              f"{per_pixel:6.2f} ns/pixel  {per_pixel / base - 1:+.0%}")
    if options.wide:
        seconds, memory = best(build(source_of(65536, 12288), pyramid, 6), pyramid, 1)
        print(f"four times as wide: {seconds:7.2f} s  {memory:5.0f} MiB")
    children = resource.getrusage(resource.RUSAGE_CHILDREN)
    print(f"(processor time of all runs: {children.ru_utime + children.ru_stime:.0f} s)")


if __name__ == "__main__":
    main()
