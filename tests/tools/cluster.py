"""What the tests of builds on clusters of Dask share."""
import json
import os
import subprocess
import sys
import time
import unittest

from frame import TOOL
from parts import PartsTest

PYTHON = os.path.join(os.path.dirname(os.path.abspath(__file__)), "../../python")
PROGRAM = os.path.join(PYTHON, "zmcraster-dask")

try:
    import distributed
except ImportError:
    distributed = None


@unittest.skipIf(distributed is None, "there is no dask.distributed here")
class ClusterTest(PartsTest):
    def dask(self, *words, **more):
        return subprocess.run([sys.executable, PROGRAM, *words], cwd=self.folder, text=True,
                              capture_output=True, timeout=300, stdin=subprocess.DEVNULL, **more)

    def started(self, *words, ahead=(), **more):
        """The program at work; `ahead` of it are the words of one that starts it."""
        return self.process([*ahead, sys.executable, PROGRAM, *words], text=True, stdout=subprocess.PIPE,
                            stderr=subprocess.PIPE, **more)

    def process(self, words, **more):
        process = subprocess.Popen(words, cwd=self.folder, stdin=subprocess.DEVNULL, **more)

        def end():
            process.kill()
            process.communicate()

        self.addCleanup(end)
        return process

    def wrapper(self, lines):
        """A command that does something of its own before it is zmcraster."""
        with open(self.path("tool"), "w") as file:
            file.write(f"#!/bin/sh\n{lines}\nexec {TOOL} \"$@\"\n")
        os.chmod(self.path("tool"), 0o755)
        return self.path("tool")

    def touch(self, name):
        with open(self.path(name), "w"):
            pass

    def wait_for(self, name, process):
        """What a file holds as soon as it holds anything, while a process works."""
        while not os.path.exists(self.path(name)) or not os.path.getsize(self.path(name)):
            self.assertIsNone(process.poll())
            time.sleep(0.02)
        with open(self.path(name)) as file:
            return file.read().strip()

    def scheduler(self, host="127.0.0.1", ahead=(), **more):
        """A scheduler, and its address."""
        os.makedirs(self.path("dask"), exist_ok=True)
        place = os.path.join("dask", f"scheduler-{time.monotonic_ns()}.json")
        process = self.process([*ahead, "dask-scheduler", "--host", host, "--port", "0", "--no-dashboard",
                                "--scheduler-file", place], stderr=subprocess.DEVNULL, **more)
        return process, json.loads(self.wait_for(place, process))["address"]

    def worker(self, address, ahead=(), **more):
        return self.process([*ahead, "dask-worker", address, "--nthreads", "1", "--no-nanny",
                             "--no-dashboard", "--local-directory", self.path("dask")],
                            stderr=subprocess.DEVNULL, stdout=subprocess.DEVNULL, **more)
