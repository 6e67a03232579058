"""Builds in parts whose processes are ended, stopped or without room: what there was stays, and going on
gives the same file."""
import errno
import fcntl
import os
import resource
import signal
import subprocess
import time

from frame import TOOL
from parts import FULL, PLAN, PartsTest, drawn, luck


class Ended(PartsTest):
    """Processes that are ended before a call of theirs on the folder."""

    OPEN, WRITE, SYNC, RENAME, REMOVE = 1, 4, 16, 64, 128
    KILL = 3

    def faulty(self, calls, n, action, *words, error=0, for_good=0):
        preload = os.environ.get("ZMC_FILE_FAULTS_LIBRARY")
        if not preload:
            self.skipTest("nothing can be loaded ahead of the program here")
        return self.run_tool(*words, env={
            **os.environ, "LD_PRELOAD": preload, "ZMC_FILE_FAULTS_COUNT": self.path("calls"),
            "ZMC_FILE_FAULTS": f"{calls} {n} {for_good} {action} {error} {self.folder}"})

    def ended(self, n, calls, *words):
        """Runs the program until the n-th such call; whether it was ended there."""
        done = self.faulty(calls, n, self.KILL, *words)
        self.assertIn(done.returncode, (0, -signal.SIGKILL), done)
        return done.returncode != 0

    def calls_of(self, calls, *words):
        """How many there are when all goes well."""
        self.assertFalse(self.ended(0, calls, *words))
        with open(self.path("calls")) as file:
            count = int(file.read())
        os.remove(self.path("calls"))
        return count

    def undo(self):
        """Parts that were never made, in a file full of something else: their levels, 0 and 1, stand last."""
        pyramid = self.pyramid_path()
        for name in os.listdir(pyramid + ".parts"):
            os.remove(os.path.join(pyramid + ".parts", name))
        with open(pyramid, "r+b") as file:
            size = (1100 * 700 + 550 * 350) * 4
            file.seek(os.path.getsize(pyramid) - size)
            file.write(b"\xEE" * size)

    def test_a_part_that_is_ended_anywhere_is_made_again(self):
        calls = self.OPEN | self.WRITE | self.SYNC | self.RENAME
        words = "part", self.path(PLAN), "0-5"
        self.source()
        expected = self.expected()
        self.plan()
        count = self.calls_of(calls, *words)
        self.assertGreater(count, 40)
        whole, records = self.content(self.pyramid_path()), self.records()
        self.assertEqual(len(records), 6)
        for n in drawn(range(1, count + 1), 8):
            self.undo()
            with self.subTest(n):
                self.assertTrue(self.ended(n, calls, *words))
                left = self.records()
                self.assertEqual(left, {name: records[name] for name in sorted(records)[:len(left)]})
                self.good("part", PLAN, f"{min(len(left), 5)}-5")
                self.assertTrue(self.content(self.pyramid_path()) == whole)
                self.assertEqual(self.records(), records)
        self.good("finish", PLAN)
        self.assertFinished(expected)

    def test_a_finish_that_is_ended_anywhere_is_done_again(self):
        calls = self.OPEN | self.WRITE | self.SYNC | self.RENAME | self.REMOVE
        words = "finish", self.path(PLAN), "--threads", "1"
        self.source()
        expected = self.expected()

        def begin():
            with open(self.path("made.pyr"), "wb") as file:
                file.write(b"old")
            self.plan("--overwrite")
            self.good("part", PLAN, "0-5")

        begin()
        count = self.calls_of(calls, *words)
        self.assertFinished(expected)
        # The last few put the file in its place and clear up.
        for n in drawn(range(1, count - 14), 6) + drawn(range(count - 14, count + 1), 4):
            # One that was ended too early to finish is gone on with by the next.
            if FULL or PLAN not in self.files():
                begin()
            with self.subTest(n):
                self.ended(n, calls, *words)
                self.assertTrue(self.content("made.pyr") in (b"old", expected[0]))
                if self.content("made.pyr") != b"old" or FULL:
                    if PLAN in self.files():
                        self.good("finish", PLAN)
                    self.assertFinished(expected)
        if PLAN in self.files():
            self.good("finish", PLAN)
        self.assertFinished(expected)

    def test_a_plan_that_is_ended_anywhere_is_made_again(self):
        calls = self.OPEN | self.WRITE | self.SYNC | self.RENAME
        words = "plan", self.path("source.tif"), self.path("made.pyr"), "--part-size", "512"
        self.source()
        expected = self.expected()
        before = self.files()
        count = self.calls_of(calls, *words)
        self.good("finish", PLAN, "--discard")
        self.assertEqual(self.files(), before)
        for n in drawn(range(1, count + 1), 6):
            with self.subTest(n):
                self.assertTrue(self.ended(n, calls, *words))
                self.plan("--overwrite")
                self.assertEqual(len(self.hidden()), 2)
                self.good("finish", PLAN, "--discard")
                self.assertEqual(self.files(), before)
        self.plan()
        self.good("part", PLAN, "0-5")
        self.good("finish", PLAN)
        self.assertFinished(expected)

    def test_a_disk_that_is_full_fails_one_worker_and_harms_nothing(self):
        fail = 0
        self.source()
        expected = self.expected()
        self.plan()
        self.good("part", PLAN, "0-2")
        # Of part 3 a tile, and the record.
        for n, text in (2, "cannot write a tile"), (4, "cannot keep the record of the part"):
            done = self.faulty(self.WRITE, n, fail, "part", self.path(PLAN), "3-5", error=errno.ENOSPC,
                               for_good=1)
            self.assertEqual((done.returncode, done.stdout), (1, ""))
            self.assertRegex(done.stderr, rf"^zmcraster: [^\n]*: {text}: No space left on device[^\n]*\n$")
            self.assertEqual(self.status()["missing"], [3, 4, 5])
        self.good("part", PLAN, "3-5")
        self.good("finish", PLAN)
        self.assertFinished(expected)


class Faults(PartsTest):
    def test_a_worker_without_room_fails_and_harms_nothing(self):
        def limit():
            resource.setrlimit(resource.RLIMIT_FSIZE, (1500000, 1500000))

        self.source()
        expected = self.expected()
        self.plan()
        self.good("part", PLAN, "0-2")
        done = self.run_tool("part", PLAN, "3-5", preexec_fn=limit)
        self.assertEqual((done.returncode, done.stdout), (1, ""))
        self.assertRegex(done.stderr, r"^zmcraster: made\.pyr: cannot write a tile: File too large "
                                      r"\(writing \d+ bytes at offset \d+\)\n$")
        self.assertEqual(self.status()["missing"], [3, 4, 5])
        self.good("part", PLAN, "3-5")
        self.good("finish", PLAN)
        self.assertFinished(expected)

    def test_workers_killed_at_random_lose_only_what_they_were_at(self):
        self.source("Double", 1500, 1500)
        expected = self.expected()
        parts = self.plan("--overwrite", size="256")
        self.assertGreater(parts, 30)
        begin = time.monotonic()
        self.good("part", PLAN, f"0-{parts - 1}")
        usual = time.monotonic() - begin
        chance = luck("kills")
        killed = 0
        while killed < (500 if FULL else 8):
            missing = self.status()["missing"]
            if not missing:  # every file that was made under kills is looked at
                self.good("finish", PLAN)
                self.assertFinished(expected)
                self.plan("--overwrite", size="256")
                continue
            worker = subprocess.Popen([TOOL, "part", PLAN, *map(str, missing)], cwd=self.folder)
            try:
                worker.wait(chance.uniform(0, usual))
            except subprocess.TimeoutExpired:
                worker.kill()
                worker.wait()
                killed += 1
            left = self.status()["missing"]
            self.assertEqual(left, missing[len(missing) - len(left):])
        missing = self.status()["missing"]
        if missing:  # none of those that are there is made again
            self.good("part", PLAN, *map(str, missing))
        self.good("finish", PLAN)
        self.assertFinished(expected)

    def stopped(self, *words):
        """A process that was stopped when its first record stood there."""
        worker = subprocess.Popen([TOOL, *words], cwd=self.folder, stdout=subprocess.PIPE,
                                  stderr=subprocess.PIPE, text=True)
        self.addCleanup(worker.kill)
        while not self.records():
            self.assertIsNone(worker.poll())
            time.sleep(0.001)
        worker.send_signal(signal.SIGSTOP)
        return worker

    def test_a_worker_that_stands_still_while_its_part_is_given_to_another(self):
        self.source("Double", 1500, 1500)
        expected = self.expected()
        parts = self.plan(size="256")
        worker = self.stopped("part", PLAN, f"0-{parts - 1}")
        missing = self.status()["missing"]
        self.assertGreater(len(missing), 2, "it is too quick for this test")
        self.good("part", PLAN, *missing)
        worker.send_signal(signal.SIGCONT)
        self.assertEqual((worker.communicate(timeout=60), worker.returncode), (("", ""), 0))
        self.good("finish", PLAN)
        self.assertFinished(expected)

    def test_a_worker_that_goes_on_when_all_is_finished_changes_nothing(self):
        self.source("Double", 1500, 1500)
        expected = self.expected()
        parts = self.plan(size="256")
        worker = self.stopped("part", PLAN, f"0-{parts - 1}")
        self.good("part", PLAN, *self.status()["missing"])
        self.good("finish", PLAN)
        worker.send_signal(signal.SIGCONT)
        output, errors = worker.communicate(timeout=60)
        self.assertEqual((worker.returncode, output, errors),
                         (1, "", f"zmcraster: {PLAN}: it is finished\n"))
        self.assertFinished(expected)

    def test_a_second_finish_at_the_same_time_is_refused(self):
        self.source()
        expected = self.expected()
        self.plan()
        self.good("part", PLAN, "0-5")
        with open(self.pyramid_path()) as holder:
            fcntl.flock(holder, fcntl.LOCK_EX)
            self.refused(1, "made.pyr: cannot finish it: somebody else does so already", "finish",
                         PLAN)
        self.good("finish", PLAN)
        self.assertFinished(expected)
