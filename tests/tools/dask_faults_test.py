"""Clusters of Dask that lose what they stand on: the file is that of build all the same."""
import os
import shutil
import signal
import subprocess

from cluster import ClusterTest
from parts import PLAN


class Lost(ClusterTest):
    def test_a_scheduler_that_is_killed_is_told_and_another_goes_on(self):
        self.source("Double")
        expected = self.expected()
        tool = self.wrapper('if [ "$1" = part ] && [ "$3" = 3 ] && [ ! -e mended ]; then '
                            'echo $$ >slow; exec sleep 60; fi')
        scheduler, address = self.scheduler()
        worker = self.worker(address)
        build = self.started("source.tif", "made.pyr", "--scheduler", address, "--tool", tool,
                             "--part-size", "512")
        slow = int(self.wait_for("slow", build))
        scheduler.kill()
        output, errors = build.communicate(timeout=60)
        worker.kill()
        os.kill(slow, signal.SIGKILL)
        self.assertEqual((build.returncode, output, errors),
                         (1, "", f"zmcraster-dask: {PLAN}: the scheduler is gone; what is done can be "
                                 "gone on with\n"))
        self.assertIn(3, self.status()["missing"])
        self.touch("mended")
        done = self.dask("source.tif", "made.pyr", "--workers", "1", "--tool", tool, "--resume", "-q")
        self.assertEqual((done.returncode, done.stdout, done.stderr), (0, "", ""))
        self.assertFinished(expected)


class CutOff(ClusterTest):
    """Machines of their own are namespaces of the network here."""

    def setUp(self):
        super().setUp()
        if not all(map(shutil.which, ("unshare", "nsenter", "ip"))):
            self.skipTest("no namespaces can be made here")
        self.here = self.namespace("unshare", "--user", "--map-root-user", "--net")
        self.there = self.namespace(*self.within(self.here), "unshare", "--net")
        self.command(self.here, "ip", "link", "add", "name", "zmc0", "type", "veth", "peer", "name", "zmc1",
                     "netns", str(self.there.pid))
        for place, link, address in ((self.here, "zmc0", "10.9.8.1/24"), (self.there, "zmc1", "10.9.8.2/24")):
            self.command(place, "ip", "address", "add", address, "dev", link)
            self.command(place, "ip", "link", "set", link, "up")
            self.command(place, "ip", "link", "set", "lo", "up")

    def namespace(self, *words):
        holder = self.process([*words, "sh", "-c", "echo made; exec sleep 300"], stdout=subprocess.PIPE, text=True)
        if holder.stdout.readline() != "made\n":
            self.skipTest("no namespaces can be made here")
        return holder

    @staticmethod
    def within(place):
        return ["nsenter", "--target", str(place.pid), "--user", "--net", "--preserve-credentials"]

    def command(self, place, *words):
        done = subprocess.run([*self.within(place), *words], capture_output=True, text=True)
        self.assertEqual((done.returncode, done.stderr), (0, ""), words)

    def test_a_worker_that_is_cut_off_while_its_part_is_given_to_another(self):
        self.source("Double")
        expected = self.expected()
        # The one that is cut off waits with its first part until the other has begun with the same.
        tool = self.wrapper('if [ "$1" = part ] && [ "$CUT" ]; then echo "$3" >cut; n=0; '
                            'while [ ! -e again ] && [ $n -lt 600 ]; do sleep 0.05; n=$((n + 1)); done; '
                            'elif [ "$1" = part ] && [ "$3" = "$(cat cut 2>/dev/null)" ]; then : >again; fi')
        environment = {**os.environ, "DASK_DISTRIBUTED__SCHEDULER__WORKER_TTL": "1s"}
        here, there = self.within(self.here), self.within(self.there)
        _, address = self.scheduler("10.9.8.1", here, env=environment)
        self.worker(address, there, env={**environment, "CUT": "1"})
        build = self.started("source.tif", "made.pyr", "--scheduler", address, "--tool", tool, "--part-size",
                             "512", "-q", ahead=here)
        self.wait_for("cut", build)
        self.command(self.here, "ip", "link", "set", "zmc0", "down")
        self.worker(address, here)
        output, errors = build.communicate(timeout=120)
        self.assertEqual((build.returncode, output, errors), (0, "", ""))
        self.assertTrue(os.path.exists(self.path("again")))
        self.assertFinished(expected)
