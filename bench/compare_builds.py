#!/usr/bin/python3 -B
"""Compares the benchmark programs of two builds, for instance of two commits.

    bench/compare_builds.py BEFORE AFTER [--rounds N] [--seconds S] [--only PROGRAM...] [--filter TEXT]

BEFORE and AFTER are build folders. The programs take turns, so that a busy moment of the machine meets
both; of each benchmark the quickest round counts. Prints a table of ratios: time before divided by
time after, so that above 1 is quicker now. What only one of the two has is left out and counted.
"""
import argparse
import json
import os
import pathlib
import subprocess
import sys
import tempfile


def programs(build):
    return {path.name: path for path in sorted(pathlib.Path(build, "bench").iterdir())
            if path.is_file() and os.access(path, os.X_OK)}


def times(program, arguments):
    """Nanoseconds by the benchmark's name."""
    with tempfile.NamedTemporaryFile(suffix=".json") as out:
        command = [program, f"--benchmark_out={out.name}", "--benchmark_out_format=json",
                   f"--benchmark_min_time={arguments.seconds}"]
        if arguments.filter:
            command.append(f"--benchmark_filter={arguments.filter}")
        done = subprocess.run(command, stdout=subprocess.DEVNULL, stderr=subprocess.PIPE, text=True,
                              cwd=os.path.dirname(os.path.dirname(program)))
        text = pathlib.Path(out.name).read_text(encoding="utf-8")
    if done.returncode != 0 or not text:
        raise RuntimeError(f"{program}: {done.stderr.strip()[-300:]}")
    units = {"ns": 1, "us": 1e3, "ms": 1e6, "s": 1e9}
    return {row["name"]: row["real_time"] * units[row["time_unit"]]
            for row in json.loads(text)["benchmarks"]
            if row.get("run_type") != "aggregate" and "error_occurred" not in row}


def main():
    parser = argparse.ArgumentParser(description=__doc__,
                                     formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("before")
    parser.add_argument("after")
    parser.add_argument("--rounds", type=int, default=3)
    parser.add_argument("--seconds", default="0.1", help="least time of a benchmark (default 0.1)")
    parser.add_argument("--only", nargs="+", help="these programs")
    parser.add_argument("--filter", help="benchmarks whose name matches")
    arguments = parser.parse_args()
    before, after = programs(arguments.before), programs(arguments.after)
    names = [name for name in after if name in before and name in (arguments.only or after)]
    if not names:
        sys.exit("the builds have no program in common")
    unmatched = 0
    for name in names:
        best = {}
        try:
            for _ in range(arguments.rounds):
                for side, build in (("before", before), ("after", after)):
                    for row, time in times(str(build[name].resolve()), arguments).items():
                        place = best.setdefault(row, {})
                        place[side] = min(place.get(side, time), time)
        except RuntimeError as error:
            print(f"{name}: {error}")
            continue
        print(name)
        for row, place in best.items():
            if len(place) == 2:
                print(f"  {row:<58} {place['before']:14.0f} {place['after']:14.0f} ns "
                      f"{place['before'] / place['after']:6.3f}", flush=True)
            else:
                unmatched += 1
    print(f"{unmatched} benchmarks stand in one build alone")


if __name__ == "__main__":
    main()
