"""Runs every command and every entry of the driver on hostile files, and judges what they did.

Nothing may crash, hang, write where it was to read, leave a file open, or cost more than it shows: a
second of processor time, 64 MiB of memory and 64 MiB of files beyond what the same takes on a small
good file, and as much again for each 32 MiB of what it is asked to go through or prints. Commands go
through all pixels of a complete file, holes included; where that is more than GOES_THROUGH, what is
judged is that they end when they are asked to. So are levels that the driver makes; those that GDAL
writes beside the file count as what was gone through. A store makes a tree of the document, which takes
several times its text, and an edit by the driver is three stores, which may take a second each. The memory
of a build is what it is told.

    attack.py FOLDER [--files N] [--first K] [--jobs N]

Needs ZMC_TOOL, the program, and the plug-in on GDAL_DRIVER_PATH. With ZMC_ATTACK=sanitized the program
is one with sanitizers, which a driver in Python cannot be: only commands run, and what they cost is not
judged. Prints a line for each finding and a
summary, and keeps the files of findings in FOLDER. The exit status is 1 if there is a finding.
"""
import argparse
import ctypes
import hashlib
import multiprocessing
import os
import queue
import random
import re
import resource
import signal
import subprocess
import sys
import time
import traceback

import hostile

TOOL = os.environ["ZMC_TOOL"]
SANITIZED = os.environ.get("ZMC_ATTACK") == "sanitized"
SECONDS = 1.0
YARDSTICK = 20_000_000  # steps of a loop, which take a second of a processor of 2.3 GHz that is all ours
STORES = 3  # of the document by driver_edits, each of which may take as long
MEMORY = 64 << 20
PATIENCE = 300 if SANITIZED else 60  # seconds of waiting, after which a run is taken to hang
ENDS_WITHIN = 60 if SANITIZED else 5  # seconds of processor time, where it is asked to end
ASKS_AFTER = 2  # seconds of processor time of a run that is asked to end
SILENCE = 600  # seconds without a word of any worker
INTERRUPTED = 130  # the status of a command that ended because it was asked to
PER_BYTES = 32 << 20  # for which the budget is granted once more
TREE = 6  # bytes for each of a document that is stored into
PER_BAND = 1024  # bytes that GDAL may take for a band that a dataset shows
GOES_THROUGH = 256 << 20  # bytes of pixels
READING = {
    "info": ["info", "FILE"],
    "info-json": ["info", "FILE", "--json"],
    "verify": ["verify", "FILE"],
    "hash": ["hash", "FILE"],
    "compare": ["compare", "FILE", "GOOD"],
    "export": ["export", "FILE", "OUT.tif"],
    "preview": ["preview", "FILE", "OUT.png"],
    "build": ["build", "FILE", "OUT.pyr", "--memory", "32M"],
}
# What the module says, by its contract, of a file that it opens all the same.
WARNED = re.compile(r"\nWarning at file .*\n Message: .*\n")
LONG = ("verify", "hash", "compare", "export", "preview", "build")  # with the pixels of a complete file
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


def build_overviews(dataset, seconds):
    """Makes the first coarser level, and cancels it after so much processor time. In C: the Python
    function is asked at each hundredth of the work only, which may be hours."""
    with open("/proc/self/maps") as maps:
        library = ctypes.CDLL(next(line.split()[-1] for line in maps if "/libgdal.so" in line))
    asked = ctypes.CFUNCTYPE(ctypes.c_int, ctypes.c_double, ctypes.c_char_p, ctypes.c_void_p)
    numbers = ctypes.POINTER(ctypes.c_int)
    build = library.GDALBuildOverviews
    build.argtypes = [ctypes.c_void_p, ctypes.c_char_p, ctypes.c_int, numbers, ctypes.c_int, numbers,
                      asked, ctypes.c_void_p]
    end = time.process_time() + seconds
    build(int(dataset.this), b"NEAREST", 1, (ctypes.c_int * 1)(2), 0, None,
          asked(lambda *_: time.process_time() < end), None)


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
        build_overviews(dataset, 0.3)
    dataset = None


DRIVER = {"gdal-read": driver_reads, "gdal-edit": driver_edits}


def slowness():
    """How many times the processor time of a quiet machine a piece of work takes now. What runs on the
    other thread of a core may double it."""
    start, total = time.process_time(), 0
    for number in range(YARDSTICK):
        total += number
    return max(1.0, time.process_time() - start)


def digest(names):
    found = {}
    for name in names:
        status = os.lstat(name)
        total = hashlib.sha256()
        with open(name, "rb") as file:  # holes may be terabytes
            for _ in range(64):
                total.update(file.read(1 << 17))
            file.seek(max(file.tell(), status.st_size - 4096))
            total.update(file.read(4096))
        found[name] = (status.st_size, status.st_mode, total.hexdigest())
    return found


class Cost:
    """What a run took, and how it ended."""

    def __init__(self, seconds, memory, status, message, hung, asked):
        self.seconds, self.memory, self.status = seconds, memory, status
        self.message, self.hung, self.asked = message, hung, asked
        self.printed = self.written = 0


def processor_time(child):
    """Seconds that all threads of a child process have taken so far."""
    with open(f"/proc/{child}/stat") as stream:
        fields = stream.read().rpartition(")")[2].split()
    return (int(fields[11]) + int(fields[12])) / os.sysconf("SC_CLK_TCK")


def wait(child, pipe, ask_after=None):
    """The end of a child process: its cost, as the system counted it. One that is still at work after
    some seconds is asked to end, if they are given, and in the end made to: seconds of its own, so that
    whoever else is served meanwhile changes nothing, and of the clock if it only waits."""
    hung = asked = False
    begin = time.monotonic()
    patience, enough = PATIENCE, float("inf")
    while True:
        done, status, usage = os.wait4(child, os.WNOHANG)
        if done:
            break
        waited = time.monotonic() - begin
        if ask_after is not None and not asked and (
                processor_time(child) > ask_after or waited > PATIENCE / 2):
            os.kill(child, signal.SIGTERM)
            asked, patience, enough = True, waited + PATIENCE, processor_time(child) + ENDS_WITHIN
        if waited > patience or (asked and processor_time(child) > enough):
            os.kill(child, signal.SIGKILL)
            hung = True
            _, status, usage = os.wait4(child, 0)
            break
        time.sleep(0.002)
    pipe.seek(0)
    message = pipe.read(100000).decode("utf-8", "replace")
    return Cost(usage.ru_utime + usage.ru_stime, usage.ru_maxrss << 10,
                os.waitstatus_to_exitcode(status), message, hung, asked)


def limit_processor_time():
    """For a child: one that nobody waits for any more ends by itself."""
    resource.setrlimit(resource.RLIMIT_CPU, (2 * PATIENCE, 2 * PATIENCE + 5))


def run_tool(arguments, folder, ask_after=None):
    with open(os.path.join(folder, "stderr"), "w+b") as errors, \
            open(os.path.join(folder, "stdout"), "w+b") as output:
        child = subprocess.Popen([TOOL, *arguments], cwd=folder, stdin=subprocess.DEVNULL,
                                 stdout=output, stderr=errors, preexec_fn=limit_processor_time)
        cost = wait(child.pid, errors, ask_after)
        child.returncode = cost.status  # it has been waited for
        cost.printed = os.path.getsize(output.name)
        return cost


def run_driver(action, name, folder):
    """In a process of its own that shares the library that is loaded already."""
    with open(os.path.join(folder, "stderr"), "w+b") as errors:
        child = os.fork()
        if child == 0:
            status = 1
            try:
                from osgeo import gdal
                os.dup2(errors.fileno(), 2)
                limit_processor_time()
                gdal.DontUseExceptions()
                gdal.PushErrorHandler("CPLQuietErrorHandler")
                action(name)
                for left in left_open(folder):
                    os.write(2, f"{LEFT_OPEN}{left}\n".encode())
                status = 0
            except BaseException:
                os.write(2, traceback.format_exc().encode("utf-8", "replace"))
            finally:
                os._exit(status)
        return wait(child, errors)


class Runner:
    """A process of its own that starts the others: what those who start a process hold in memory is
    counted as its own, and the makers of hostile files hold much."""

    def __init__(self):
        context = multiprocessing.get_context("spawn")
        self.pipe, other = context.Pipe()
        self.process = context.Process(target=serve, args=(other,), daemon=True)
        self.process.start()
        other.close()

    def run(self, function, *arguments):
        self.pipe.send((function, arguments))
        return self.pipe.recv()


def serve(pipe):
    if not SANITIZED:
        from osgeo import gdal
        assert gdal.GetDriverByName("ZMCPyramid"), "the driver's plug-in is not found"
    while True:
        try:
            function, arguments = pipe.recv()
        except EOFError:
            return
        pipe.send(function(*arguments))


LEFT_OPEN = "left open: "


def left_open(folder):
    """Files of the folder, but for what was said, that this process has open."""
    for number in os.listdir("/proc/self/fd"):
        try:
            path = os.readlink(f"/proc/self/fd/{number}")
        except OSError:
            continue  # of the list itself
        if path.startswith(os.path.realpath(folder) + os.sep) and not path.endswith("/stderr"):
            yield path


def room(folder):
    """Bytes that the files of a folder take on the disk."""
    total = 0
    for entry in os.scandir(folder):
        try:
            total += entry.stat(follow_symlinks=False).st_blocks * 512
        except FileNotFoundError:
            pass
    return total


class Attacker:
    def __init__(self, folder, ask_after=ASKS_AFTER):
        self.folder = folder
        self.ask_after = ask_after  # seconds
        os.makedirs(folder, exist_ok=True)
        self.runner = Runner()
        self.good = os.path.join(folder, "good.pyr")
        good = hostile.Draft(random.Random(1))
        good.fields.update(BANDS="1", PIXEL_HEIGHT="30", PIXEL_WIDTH="40", LEVELMAX="0",
                           TILESIZE="256", BUILD_METHOD="Blocked", PIXEL_TYPE="Byte")
        good.records = [good.statistics(0)]
        good.save(self.good)
        self.base = {}
        for name, cost in self.all_runs(self.good, None):
            assert cost.status in self.good_ends(name, cost), (name, cost.status, cost.message)
            self.base[name] = cost
        good.save(self.good)  # edits have changed it

    def all_runs(self, file, ask_after):
        """Each run's name and cost. Those that go through all pixels are asked to end after some
        seconds, if they are given."""
        before = room(self.folder)
        for name, arguments in READING.items():
            texts = [file if text == "FILE" else self.good if text == "GOOD" else text
                     for text in arguments]
            cost = self.runner.run(run_tool, texts, self.folder,
                                   ask_after if name in LONG else None)
            cost.written = room(self.folder) - before
            for made in ("OUT.tif", "OUT.tif.aux.xml", "OUT.pyr", "OUT.pyr.aux.xml"):
                if os.path.lexists(os.path.join(self.folder, made)):
                    os.remove(os.path.join(self.folder, made))
            yield name, cost
        if not SANITIZED:
            yield "gdal-read", self.runner.run(run_driver, driver_reads, file, self.folder)
        for name in WRITING:
            texts = [file if text == "FILE" else text for text in WRITING[name]]
            yield name, self.runner.run(run_tool, texts, self.folder)
        if not SANITIZED:
            cost = self.runner.run(run_driver, driver_edits, file, self.folder)
            cost.written = room(self.folder) - before
            yield "gdal-edit", cost

    def judge(self, name, cost, size, held, bands):
        """`size` bytes may be gone through, of which `held` are no holes."""
        base = self.base[name]
        goes_through = size if name in LONG or name in DRIVER else held
        longer = (STORES if name == "gdal-edit" else 1) + (goes_through + 8 * cost.printed) / PER_BYTES
        grants = 1 + ((size if name in LONG else held) + 8 * cost.printed) / PER_BYTES
        shown = bands * PER_BAND if name in DRIVER else 0
        if name == "gdal-edit":
            shown += TREE * held
        if cost.hung and cost.asked:
            yield f"does not end within {ENDS_WITHIN} s of its own when it is asked to"
        elif cost.hung:
            yield f"hangs ({cost.seconds:.1f} s of processor time)"
        elif cost.status < 0:
            yield f"is killed by signal {-cost.status}"
        elif cost.status not in self.good_ends(name, cost):
            yield f"ends with status {cost.status}"
        if not SANITIZED:
            yield from self.judge_cost(cost, base, longer, grants, shown)
        if name not in DRIVER and cost.status in (1, 2):
            lines = WARNED.sub("", cost.message).splitlines()
            if not lines or not all(line.startswith("zmcraster: ") for line in lines):
                yield f"says {cost.message[:200]!r}"
            if len([line for line in lines if "warning: " not in line]) != 1:
                yield f"says it in {len(lines)} lines: {cost.message[:300]!r}"
        for sign in ("AddressSanitizer", "runtime error:", "Traceback", "terminate called",
                     LEFT_OPEN):
            if sign in cost.message:
                yield f"reports {cost.message[:2000]}"

    @staticmethod
    def good_ends(name, cost):
        if name in DRIVER:
            return (0,)
        return (0, 1, 2, 3, INTERRUPTED) if cost.asked else (0, 1, 2, 3)

    @staticmethod
    def judge_cost(cost, base, longer, grants, shown):
        took = cost.seconds - base.seconds
        if took > SECONDS * longer and took > SECONDS * longer * slowness():
            yield f"takes {cost.seconds:.2f} s of processor time"
        if cost.memory - base.memory > MEMORY * grants + shown:
            yield f"takes {(cost.memory - base.memory) >> 20} MiB"
        if cost.written - base.written > MEMORY * grants:
            yield f"writes {(cost.written - base.written) >> 20} MiB"

    def attack(self, seed):
        """Findings on the file of that number."""
        file = os.path.join(self.folder, f"hostile-{seed}.pyr")
        draft = hostile.draft(seed)
        return [f"{seed} ({', '.join(draft.kinds)}): {text}"
                for text in self.judge_draft(draft, file)]

    def judge_draft(self, draft, file):
        return self.judge_file(file, draft.save(file), draft.number("BANDS", 65536))

    def judge_file(self, file, names, bands):
        """Findings on a file, which goes, with those of `names` beside it. Copies of what was found
        stay."""
        whole = os.path.getsize(file)
        size = min(whole, GOES_THROUGH)
        held = min(size, os.stat(file).st_blocks * 512)
        before = digest(names)
        findings = []
        for name in names:
            subprocess.run(["cp", "--sparse=always", name, self.copy_of(name)], check=True)
        listed = set(os.listdir(self.folder))
        for name, cost in self.all_runs(file, self.ask_after if whole > GOES_THROUGH else None):
            # Nothing else has to look at more than the document that is in the file.
            beside = os.path.getsize(file + ".ovr") if os.path.exists(file + ".ovr") else 0
            for what in self.judge(name, cost, size + beside, held + beside, bands):
                findings.append(f"{name} {what}")
            if name in READING or name == "gdal-read":
                if digest(names) != before:
                    findings.append(f"{name} changes what it reads")
                    before = digest(names)
                left = set(os.listdir(self.folder)) - listed - {"stderr", "stdout"}
                if left:
                    findings.append(f"{name} leaves {sorted(left)}")
                    listed |= left
        for name in os.listdir(self.folder):
            if name.startswith(os.path.basename(file)):
                os.remove(os.path.join(self.folder, name))
        for name in () if findings else names:
            os.remove(self.copy_of(name))
        return findings

    def copy_of(self, name):
        return os.path.join(self.folder, "found-" + os.path.basename(name))


def work(folder, seeds, results):
    attacker = Attacker(folder)
    for seed in seeds:
        results.put(attacker.attack(seed))
    results.put(None)


def next_findings(results, workers):
    """What a worker tells next. Throws queue.Empty if one has stopped without a word, or all keep
    silent."""
    end = time.monotonic() + SILENCE
    while True:
        # In this order: what one told before it stopped comes first.
        stopped = any(worker.exitcode not in (None, 0) for worker in workers)
        try:
            return results.get(timeout=1)
        except queue.Empty:
            if stopped or time.monotonic() > end:
                raise


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
            findings = next_findings(results, workers)
        except queue.Empty:
            print(f"a worker has stopped, {done} files, {found} findings", flush=True)
            for worker in workers:
                worker.terminate()
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
