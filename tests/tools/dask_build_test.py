"""Pyramids that the workers of a Dask cluster build, held against those that one process builds."""
import json
import os
import signal
import subprocess
import sys
import textwrap
import time

from cluster import PYTHON, ClusterTest
from frame import TOOL
from parts import PLAN


class Dask(ClusterTest):
    def script(self, text):
        """What a program prints that uses the module."""
        lines = (f"import sys; sys.path.insert(0, {PYTHON!r})\nimport distributed, zmcraster_dask\n"
                 "if __name__ == '__main__':\n") + textwrap.indent(text, "    ")
        done = subprocess.run([sys.executable, "-c", lines], cwd=self.folder, text=True,
                              capture_output=True, timeout=300)
        self.assertEqual(done.returncode, 0, done)
        return done.stdout

    def test_the_file_is_that_of_build(self):
        self.source("Single")
        expected = self.expected()
        done = self.dask("source.tif", "made.pyr", "--workers", "2", "--tool", TOOL, "--json",
                         "--part-size", "512")
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        report = json.loads(done.stdout)
        self.assertEqual((report["parts"], report["made"], report["workers"]), (6, 6, 2))
        self.assertFinished(expected)

    def test_a_cluster_that_runs_already_and_a_part_that_is_ended_once(self):
        self.source("Byte", bands=3)
        expected = self.expected()
        tool = self.wrapper('if [ "$1" = part ] && mkdir "ended-$3" 2>/dev/null; then kill -9 $$; fi')
        output = self.script(
            "seen = []\n"
            "with distributed.LocalCluster(n_workers=2, threads_per_worker=1, processes=False,\n"
            "                              protocol='tcp://', dashboard_address=None) as cluster:\n"
            "    with distributed.Client(cluster.scheduler_address) as client:\n"
            f"        print(zmcraster_dask.build('source.tif', 'made.pyr', client,\n"
            f"              ['--part-size', '512'], tool={tool!r},\n"
            "              progress=lambda *step: seen.append(step))['made'], seen)\n")
        self.assertEqual(output, f"6 {[('parts', n, 6) for n in range(1, 7)]}\n")
        self.assertEqual(len([name for name in self.files() if name.startswith("ended-")]), 6)
        self.assertFinished(expected)

    def test_what_libraries_complain_of_is_not_told(self):
        """Loops of events that end with something unsaid say so, whenever that is."""
        self.source("Byte")
        os.mkdir(self.path("ahead"))
        with open(self.path("ahead/sitecustomize.py"), "w", encoding="utf-8") as file:
            file.write("import logging, sys, threading, time\n"
                       "def complain():\n"
                       "    while True:\n"
                       "        time.sleep(0.1)\n"
                       "        if 'distributed.worker' in sys.modules:\n"
                       f"            open({self.path('complained')!r}, 'w').close()\n"
                       "            logging.getLogger('asyncio').error('never retrieved')\n"
                       "threading.Thread(target=complain, daemon=True).start()\n")
        tool = self.wrapper("sleep 0.5")
        done = self.dask("source.tif", "made.pyr", "--workers", "1", "--tool", tool, "--part-size", "512", "--quiet",
                         env={**os.environ, "PYTHONPATH": self.path("ahead")})
        self.assertTrue(os.path.exists(self.path("complained")))
        self.assertEqual((done.returncode, done.stdout, done.stderr), (0, "", ""))

    def test_what_fails_is_told_in_one_line_and_gone_on_with(self):
        self.source("Double")
        expected = self.expected()
        tool = self.wrapper('if [ "$1" = part ] && [ "$3" = 4 ] && [ ! -e mended ]; then '
                            'echo "zmcraster: it is broken" >&2; exit 1; fi')
        done = self.dask("source.tif", "made.pyr", "--workers", "1", "--tool", tool, "--part-size", "512",
                         "--retries", "1")
        self.assertEqual((done.returncode, done.stdout, done.stderr),
                         (1, "", "zmcraster-dask: it is broken\n"))
        self.assertIn(4, self.status()["missing"])
        self.touch("mended")
        self.script("with distributed.Client(processes=False, dashboard_address=None) as client:\n"
                    f"    zmcraster_dask.build('source.tif', 'made.pyr', client, tool={tool!r}, resume=True)\n")
        self.assertFinished(expected)

    def test_an_interruption_ends_the_processes_and_keeps_what_is_done(self):
        self.source("Double")
        expected = self.expected()
        tool = self.wrapper('if [ "$1" = part ] && [ "$3" = 3 ] && [ ! -e mended ]; then '
                            'echo $$ >slow; exec sleep 300; fi')
        build = self.started("source.tif", "made.pyr", "--workers", "1", "--tool", tool, "--part-size", "512")
        process = int(self.wait_for("slow", build))
        build.send_signal(signal.SIGINT)
        output, errors = build.communicate(timeout=60)
        self.assertEqual((build.returncode, output, errors),
                         (130, "", "zmcraster-dask: made.pyr: interrupted; --resume goes on\n"))
        for _ in range(100):
            if not os.path.exists(f"/proc/{process}"):
                break
            time.sleep(0.1)
        self.assertFalse(os.path.exists(f"/proc/{process}"))
        missing = self.status()["missing"]
        self.assertEqual(missing[0], 3)
        self.good("part", PLAN, *missing)
        self.good("finish", PLAN)
        self.assertFinished(expected)

    def test_what_cannot_be_started_is_told(self):
        self.source()
        before = self.files()
        done = self.dask("nonesuch.tif", "made.pyr", "--tool", TOOL, "--workers", "1")
        self.assertEqual((done.returncode, done.stdout, done.stderr),
                         (1, "", "zmcraster-dask: nonesuch.tif: there is no such file\n"))
        output = self.script(
            "with distributed.Client(processes=False, dashboard_address=None) as client:\n"
            f"    for target, tool, resume in (('source.tif', {TOOL!r}, False), ('made.pyr', {TOOL!r}, True),\n"
            "                                 ('made.pyr', 'nonesuch', False)):\n"
            "        try:\n"
            "            zmcraster_dask.build('source.tif', target, client, tool=tool, resume=resume)\n"
            "        except zmcraster_dask.BuildError as error:\n"
            "            print(error)\n")
        self.assertEqual(output.splitlines(), [
            "source.tif: it is the source; name another file",
            f"{PLAN}: it cannot be read: No such file or directory",
            "nonesuch: No such file or directory"])
        self.assertEqual(self.files(), before)
