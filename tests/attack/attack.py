"""Runs every command and every entry of the driver on hostile files, and judges what they did.

Nothing may crash, hang, write where it was to read, or cost more than it shows: a second of processor
time and 64 MiB beyond what the same takes on a small good file, and as much again for each 32 MiB
of file, since a reader may well read what there is.

    attack.py FOLDER [--files N] [--first K] [--jobs N]

Needs ZMC_TOOL, the program, and the plug-in on GDAL_DRIVER_PATH. Prints a line for each finding and a
summary, and keeps the files of findings in FOLDER. The exit status is 1 if there is a finding.
"""
import argparse
import hashlib
import multiprocessing
import os
import random
import signal
import subprocess
import sys
import time

import hostile

TOOL = os.environ["ZMC_TOOL"]
SECONDS = 1.0
MEMORY = 64 << 20
PATIENCE = 20  # seconds of waiting, after which a run is taken to hang
PER_BYTES = 32 << 20  # of the file, for which the budget is granted once more
READING = {
    "info": ["info", "FILE"],
    "info-json": ["info", "FILE", "--json"],
    "verify": ["verify", "FILE"],
    "hash": ["hash", "FILE"],
    "compare": ["compare", "FILE", "GOOD"],
    "export": ["export", "FILE", "OUT.tif"],
    "build": ["build", "FILE", "OUT.pyr"],
}
WRITING = {"recover": ["recover", "FILE"], "discard": ["recover", "FILE", "--discard"]}


def driver_reads(name):
    """What a viewer and a converter ask of a file."""
    from osgeo import gdal
    dataset = gdal.OpenEx(name, gdal.OF_RASTER, allowed_drivers=["ZMCPyramid"])
    if dataset is None:
        return
    dataset.GetMetadata()
    dataset.GetGeoTransform()
    for number in range(1, min(dataset.RasterCount, 4) + 1):
        band = dataset.GetRasterBand(number)
        band.GetNoDataValue()
        band.GetColorTable()
        band.GetStatistics(True, False)
        band.GetDefaultHistogram(force=0)
        band.GetMaskFlags()
        width, height = min(band.XSize, 512), min(band.YSize, 512)
        if width and height:
            band.ReadRaster(0, 0, width, height)
        for level in range(min(band.GetOverviewCount(), 8)):
            overview = band.GetOverview(level)
            if overview is not None:
                overview.ReadRaster(0, 0, min(overview.XSize, 64), min(overview.YSize, 64))


def driver_edits(name):
    """What an editor does to a file. What it wrote may be refused, and may change the file."""
    from osgeo import gdal
    dataset = gdal.OpenEx(name, gdal.OF_RASTER | gdal.OF_UPDATE, allowed_drivers=["ZMCPyramid"])
    if dataset is None:
        return
    band = dataset.GetRasterBand(1)
    table = gdal.ColorTable()
    table.SetColorEntry(0, (1, 2, 3, 4))
    band.SetColorTable(table)
    band.SetStatistics(0, 9, 4, 2)
    band.SetDefaultHistogram(0, 9, [1, 2, 3])
    if band.XSize and band.YSize:
        band.WriteRaster(0, 0, 1, 1, b"\0" * 16, 1, 1, gdal.GDT_CFloat64)
    if dataset.RasterCount <= 20:
        dataset.BuildOverviews("NEAREST", [2])
    dataset = None


DRIVER = {"gdal-read": driver_reads, "gdal-edit": driver_edits}


def digest(names):
    found = {}
    for name in names:
        status = os.lstat(name)
        head = tail = b""
        with open(name, "rb") as file:  # holes may be terabytes
            head = file.read(8 << 20)
            if status.st_size > len(head):
                file.seek(max(len(head), status.st_size - 4096))
                tail = file.read(4096)
        found[name] = (status.st_size, status.st_mode, hashlib.sha256(head + tail).hexdigest())
    return found


class Cost:
    def __init__(self, seconds, memory, status, message, hung):
        self.seconds, self.memory, self.status = seconds, memory, status
        self.message, self.hung = message, hung


def wait(child, pipe, begin):
    """The end of a child process: its cost, as the system counted it."""
    hung = False
    while True:
        done, status, usage = os.wait4(child, os.WNOHANG)
        if done:
            break
        if time.monotonic() - begin > PATIENCE:
            os.kill(child, signal.SIGKILL)
            hung = True
            _, status, usage = os.wait4(child, 0)
            break
        time.sleep(0.002)
    pipe.seek(0)
    message = pipe.read(100000).decode("utf-8", "replace")
    return Cost(usage.ru_utime + usage.ru_stime, usage.ru_maxrss << 10,
                os.waitstatus_to_exitcode(status), message, hung)


def run_tool(arguments, folder):
    with open(os.path.join(folder, "stderr"), "w+b") as errors:
        begin = time.monotonic()
        child = subprocess.Popen([TOOL, *arguments], cwd=folder, stdin=subprocess.DEVNULL,
                                 stdout=subprocess.DEVNULL, stderr=errors)
        cost = wait(child.pid, errors, begin)
        child.returncode = cost.status  # it has been waited for
        return cost


def run_driver(action, name, folder):
    """In a process of its own that shares the library that is loaded already."""
    with open(os.path.join(folder, "stderr"), "w+b") as errors:
        begin = time.monotonic()
        child = os.fork()
        if child == 0:
            try:
                from osgeo import gdal
                os.dup2(errors.fileno(), 2)
                gdal.DontUseExceptions()
                gdal.PushErrorHandler("CPLQuietErrorHandler")
                action(name)
            finally:
                os._exit(0)
        return wait(child, errors, begin)


class Attacker:
    def __init__(self, folder):
        from osgeo import gdal
        self.folder = folder
        os.makedirs(folder, exist_ok=True)
        assert gdal.GetDriverByName("ZMCPyramid"), "the driver's plug-in is not found"
        self.good = os.path.join(folder, "good.pyr")
        good = hostile.Draft(random.Random(1))
        good.fields.update(BANDS="1", PIXEL_HEIGHT="30", PIXEL_WIDTH="40", LEVELMAX="0",
                           TILESIZE="256", BUILD_METHOD="Blocked", PIXEL_TYPE="Byte")
        good.records = [good.statistics(0)]
        good.save(self.good)
        self.base = {}
        for name, cost in self.all_runs(self.good):
            assert not cost.hung and cost.status >= 0, (name, cost.status, cost.message)
            self.base[name] = cost
        good.save(self.good)  # edits have changed it

    def all_runs(self, file):
        for name, arguments in READING.items():
            texts = [file if text == "FILE" else self.good if text == "GOOD" else text
                     for text in arguments]
            cost = run_tool(texts, self.folder)
            for made in ("OUT.tif", "OUT.tif.aux.xml", "OUT.pyr", "OUT.pyr.aux.xml"):
                if os.path.lexists(os.path.join(self.folder, made)):
                    os.remove(os.path.join(self.folder, made))
            yield name, cost
        yield "gdal-read", run_driver(driver_reads, file, self.folder)
        for name in WRITING:
            yield name, run_tool([file if text == "FILE" else text for text in WRITING[name]],
                                 self.folder)
        yield "gdal-edit", run_driver(driver_edits, file, self.folder)

    def judge(self, name, cost, size):
        base = self.base[name]
        grants = 1 + size // PER_BYTES
        if cost.hung:
            yield f"hangs ({cost.seconds:.1f} s of processor time)"
        elif cost.status < 0:
            yield f"is killed by signal {-cost.status}"
        elif name not in DRIVER and cost.status not in (0, 1, 2, 3):
            yield f"ends with status {cost.status}"
        if cost.seconds - base.seconds > SECONDS * grants:
            yield f"takes {cost.seconds:.2f} s of processor time"
        if cost.memory - base.memory > MEMORY * grants:
            yield f"takes {(cost.memory - base.memory) >> 20} MiB"
        if name not in DRIVER and cost.status in (1, 2):
            lines = cost.message.splitlines()
            if not lines or not all(line.startswith("zmcraster: ") for line in lines):
                yield f"says {cost.message[:200]!r}"
            if len([line for line in lines if "warning: " not in line]) != 1:
                yield f"says it in {len(lines)} lines: {cost.message[:300]!r}"
        for sign in ("AddressSanitizer", "runtime error:", "Traceback", "terminate called"):
            if sign in cost.message:
                yield f"reports {cost.message[:2000]}"

    def attack(self, seed):
        """Findings on the file of that number."""
        file = os.path.join(self.folder, f"hostile-{seed}.pyr")
        draft = hostile.draft(seed)
        names = draft.save(file)
        size = min(os.path.getsize(file), 64 << 20)
        before = digest(names)
        findings = []
        listed = set(os.listdir(self.folder))
        for name, cost in self.all_runs(file):
            for what in self.judge(name, cost, size):
                findings.append(f"{name} {what}")
            if name in READING or name == "gdal-read":
                if digest(names) != before:
                    findings.append(f"{name} changes what it reads")
                    before = digest(names)
                left = set(os.listdir(self.folder)) - listed - {"stderr"}
                if left:
                    findings.append(f"{name} leaves {sorted(left)}")
                    listed |= left
        for name in os.listdir(self.folder):
            if name.startswith(f"hostile-{seed}."):
                os.remove(os.path.join(self.folder, name))
        if findings:
            draft.save(os.path.join(self.folder, f"found-{seed}.pyr"))
        return [f"{seed} ({', '.join(draft.kinds)}): {text}" for text in findings]


def work(folder, seeds, results):
    attacker = Attacker(folder)
    for seed in seeds:
        results.put(attacker.attack(seed))
    results.put(None)


def main():
    parser = argparse.ArgumentParser(description=__doc__,
                                     formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("folder")
    parser.add_argument("--files", type=int, default=5000)
    parser.add_argument("--first", type=int, default=0)
    parser.add_argument("--jobs", type=int, default=os.cpu_count())
    arguments = parser.parse_args()
    results = multiprocessing.Queue()
    seeds = range(arguments.first, arguments.first + arguments.files)
    workers = [multiprocessing.Process(
        target=work, args=(os.path.join(arguments.folder, f"worker-{k}"),
                           seeds[k::arguments.jobs], results)) for k in range(arguments.jobs)]
    for worker in workers:
        worker.start()
    running, done, found = len(workers), 0, 0
    while running:
        try:
            findings = results.get(timeout=600)
        except Exception:
            print("a worker has stopped", flush=True)
            return 1
        if findings is None:
            running -= 1
            continue
        done += 1
        found += len(findings)
        for finding in findings:
            print(finding, flush=True)
        if sys.stderr.isatty() or done % 100 == 0:
            print(f"{done} files", file=sys.stderr, flush=True)
    print(f"{done} files, {found} findings")
    return 1 if found or done != arguments.files else 0


if __name__ == "__main__":
    sys.exit(main())
