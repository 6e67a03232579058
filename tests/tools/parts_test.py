"""Pyramids that are built in parts, by any number of processes, held byte for byte against those that
one process builds."""
import os
import random
import shutil
import subprocess

import numpy as np
from osgeo import gdal, osr

from frame import TOOL, TYPES
from parts import PHASE, PLAN, PartsTest, drawn


class Planned(PartsTest):
    def test_types_are_that_of_build(self):
        for name in drawn(TYPES, 2):
            with self.subTest(name):
                self.source(name, bands=2)
                expected = self.expected()
                parts = self.plan("--overwrite")
                self.assertEqual(parts, 6)
                order = random.Random(name).sample(range(parts), parts)
                self.good("part", PLAN, *order[:-1])
                self.assertEqual(self.status()["missing"], order[-1:])
                self.good("part", PLAN, order[-1])
                self.good("finish", PLAN)
                self.assertFinished(expected)

    def test_methods_orderings_and_part_sizes_are_that_of_build(self):
        self.source("UInt16", bands=3, nodata=17)
        ways = ((("--resampling", "lanczos"), "256"),
                (("--resampling", "mode", "--ordering", "scanline"), "9999"),
                (("--resampling", "cubic", "--bands", "3,1"), "300x900"),
                (("--levels", "1", "--no-statistics"), "512x256"),
                (("--levels", "0", "--nodata", "none", "--bins", "7"), "1"),
                (("--embed", "--memory", "6M"), "512"))
        for options, size in drawn(ways, 2):
            with self.subTest(options):
                expected = self.expected(*options)
                parts = self.plan(*options, "--overwrite", size=size)
                self.good("part", PLAN, f"0-{parts - 1}")
                self.good("finish", PLAN, "--threads", "1")
                self.assertFinished(expected)

    def test_more_than_eight_bands_are_that_of_build(self):
        self.source("Int32", bands=9)
        expected = self.expected()
        self.good("part", PLAN, f"0-{self.plan() - 1}", "--threads", "2")
        self.good("finish", PLAN)
        self.assertFinished(expected)

    def test_georeference_and_masks_are_those_of_build(self):
        self.source("Byte", bands=3)
        self.kind = "georeferenced"
        dataset = gdal.Open(self.path("source.tif"), gdal.GA_Update)
        reference = osr.SpatialReference()
        reference.ImportFromEPSG(32631)
        dataset.SetSpatialRef(reference)
        dataset.SetGeoTransform([10, 1, 0, 20, 0, -1])
        dataset.CreateMaskBand(gdal.GMF_PER_DATASET)
        mask = np.zeros((700, 1100), np.uint8)
        mask[100:500, 30:900] = 255
        dataset.GetRasterBand(1).GetMaskBand().WriteArray(mask)
        dataset = None
        expected = self.expected()
        self.good("part", PLAN, f"0-{self.plan() - 1}")
        self.good("finish", PLAN)
        self.assertFinished(expected)
        self.assertEqual(self.content("made.pyr.msk"), self.content("built.pyr.msk"))

    def test_parts_at_once_and_twice_are_that_of_build(self):
        self.source("Double")
        expected = self.expected()
        parts = self.plan()
        workers = [subprocess.Popen([TOOL, "part", PLAN, *map(str, random.Random(PHASE + seed).sample(
            range(parts), parts))], cwd=self.folder) for seed in range(3)]
        self.assertEqual([worker.wait() for worker in workers], [0, 0, 0])
        self.good("finish", PLAN)
        self.assertFinished(expected)

    def test_counting_may_be_done_in_parts_too(self):
        self.source("Single")
        expected = self.expected()
        parts = self.plan()
        self.refused(1, f"{PLAN}: 6 of 6 parts are missing: 0-5", "part", PLAN, "0", "--count")
        self.good("part", PLAN, f"0-{parts - 1}")
        self.good("part", PLAN, "0-2", "5", "--count")
        self.assertEqual(self.status()["counted"], 4)
        self.good("finish", PLAN)
        self.assertFinished(expected)

    def test_numbers_of_parts_come_through_a_pipe_too(self):
        self.source("Int16")
        expected = self.expected()
        parts = self.plan()
        done = subprocess.run([TOOL, "part", PLAN, "--queue"], cwd=self.folder, text=True,
                              capture_output=True,
                              input="".join(f"{part:08}\n" for part in range(parts)))
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        self.assertEqual([line for line in done.stdout.splitlines() if line.startswith("done")],
                         [f"done {part}" for part in range(parts)])
        self.good("finish", PLAN)
        self.assertFinished(expected)

    def test_the_status_tells_what_is_missing(self):
        self.source()
        self.assertEqual(self.plan(), 6)
        self.assertEqual(self.good("status", PLAN),
                         "made.pyr: 0 of 6 parts done, missing 0-5\n")
        self.good("part", PLAN, "1", "3-4")
        self.assertEqual(self.good("status", PLAN),
                         "made.pyr: 3 of 6 parts done, missing 0, 2, 5\n")
        document = self.status()
        self.assertEqual((document["parts"], document["done"], document["missing"]),
                         (6, 3, [0, 2, 5]))
        self.refused(1, f"{PLAN}: 3 of 6 parts are missing: 0, 2, 5", "finish", PLAN)
        self.assertNotIn("made.pyr", self.files())
        self.good("part", PLAN, "0", "2", "5")
        self.assertEqual(self.good("status", PLAN), "made.pyr: 6 of 6 parts done\n")

    def test_another_folder_to_work_in_makes_no_difference(self):
        self.source()
        expected = self.expected()
        self.plan()
        for words in (("part", self.path(PLAN), "0-5"), ("finish", self.path(PLAN))):
            done = subprocess.run([TOOL, *words], cwd="/", capture_output=True, text=True)
            self.assertEqual((done.returncode, done.stderr), (0, ""))
        self.assertFinished(expected)

    def test_a_link_for_a_target_stays_one(self):
        self.source()
        expected = self.expected()
        os.mkdir(self.path("far"))
        os.symlink("far/real.pyr", self.path("made.pyr"))
        self.plan()
        self.good("part", PLAN, "0-5")
        self.good("finish", PLAN)
        self.assertTrue(os.path.islink(self.path("made.pyr")))
        self.assertEqual(self.content("far/real.pyr"), expected[0])
        self.assertEqual(os.listdir(self.path("far")), ["real.pyr"])

    def test_a_plan_is_dropped_or_made_anew(self):
        self.source()
        before = self.files()
        self.plan()
        self.refused(1, f"{PLAN}: there is a plan already; finish it, or drop it with --overwrite",
                     "plan", "source.tif", "made.pyr")
        self.good("part", PLAN, "0-5")
        self.plan("--overwrite")
        self.assertEqual(self.status()["done"], 0)
        self.assertEqual(len(self.hidden()), 2)
        self.good("finish", PLAN, "--discard")
        self.assertEqual(self.files(), before)

    def test_a_build_beside_a_plan_leaves_it_alone(self):
        self.source()
        expected = self.expected()
        self.plan()
        self.good("part", PLAN, "0-2")
        self.good("build", "source.tif", "made.pyr")
        self.assertEqual(self.status()["done"], 3)
        self.good("part", PLAN, "3-5")
        self.refused(1, "made.pyr: the file has changed since the plan was made; --overwrite "
                        "replaces it", "finish", PLAN)
        self.good("finish", PLAN, "--overwrite")
        self.assertFinished(expected)


class Scripts(PartsTest):
    """The scripts for clusters, with programs in the place of theirs that start the same lines here."""

    EXAMPLES = os.path.join(os.path.dirname(os.path.abspath(__file__)), "../../examples")

    def run_script(self, name, *words, **programs):
        os.mkdir(self.path("bin"))
        os.symlink(TOOL, self.path("bin/zmcraster"))
        for program, text in programs.items():
            with open(self.path("bin/" + program), "w") as file:
                file.write("#!/bin/bash\nset -e\n" + text)
            os.chmod(self.path("bin/" + program), 0o755)
        done = subprocess.run([os.path.join(self.EXAMPLES, name), *words], cwd=self.folder,
                              capture_output=True, text=True, timeout=120,
                              env={**os.environ, "TASKS": "3",
                                   "PATH": self.path("bin") + ":" + os.environ["PATH"]})
        self.assertEqual((done.returncode, done.stderr), (0, ""), done)
        shutil.rmtree(self.path("bin"))
        return done.stdout

    def test_slurm(self):
        self.source()
        expected = self.expected()
        self.run_script("slurm-pyramid", "source.tif", "made.pyr", "--part-size", "256", sbatch='''
            while [ "$1" != --wrap ]; do
                if [ "$1" = --array ]; then last=${2#0-}; fi
                if [ "$1" = --dependency ]; then test "$2" = afterok:77; fi
                shift
            done
            for task in $(seq 0 ${last:-0}); do
                SLURM_ARRAY_TASK_ID=$task bash -c "$2" >/dev/null & jobs="$jobs $!"
            done
            for job in $jobs; do wait $job; done
            echo 77''')
        self.assertFinished(expected)

    def test_mpi(self):
        self.source()
        expected = self.expected()
        self.run_script("mpi-pyramid", "3", "source.tif", "made.pyr", "--part-size", "256", mpirun='''
            test "$1" = -n && count=$2 && shift 2
            for rank in $(seq 0 $((count - 1))); do
                OMPI_COMM_WORLD_RANK=$rank "$@" & jobs="$jobs $!"
            done
            for job in $jobs; do wait $job; done''')
        self.assertFinished(expected)
