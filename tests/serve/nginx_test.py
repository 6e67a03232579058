"""Two servers behind nginx, with the configuration that the documents show."""
import http.client
import os
import pathlib
import shutil
import subprocess
import tempfile
import time
import unittest

import numpy as np

from server_test import TOOL, Server, geotiff, make_old, samples

EXAMPLE = pathlib.Path(__file__).resolve().parents[2] / "examples" / "nginx.conf"
NGINX = shutil.which("nginx", path=os.environ.get("PATH", "") + ":/usr/sbin:/sbin")


def free_port():
    with http.client.socket.socket() as probe:
        probe.bind(("127.0.0.1", 0))
        return probe.getsockname()[1]


@unittest.skipIf(NGINX is None, "nginx is not installed")
class NginxTest(unittest.TestCase):
    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="zmcnginx")
        self.addCleanup(shutil.rmtree, self.folder)
        self.data = os.path.join(self.folder, "data")
        for part in ("data", "tmp"):
            os.mkdir(os.path.join(self.folder, part))
        self.build(samples("Byte", 700, 900, 3))
        self.servers = [self.enterContext(Server(self.data)) for _ in range(2)]
        self.port = free_port()
        text = EXAMPLE.read_text(encoding="utf-8")
        for old, new in ((8081, self.servers[0].port), (8082, self.servers[1].port),
                         (8080, self.port)):
            text = text.replace(f"127.0.0.1:{old};", f"127.0.0.1:{new};")
        pathlib.Path(self.folder, "nginx.conf").write_text("user root;\n" * (os.getuid() == 0) +
                                                           text, encoding="utf-8")
        nginx = subprocess.Popen([NGINX, "-p", self.folder, "-c", "nginx.conf", "-e", "stderr", "-g",
                                  "daemon off;"], stderr=subprocess.DEVNULL)
        self.addCleanup(nginx.wait)
        self.addCleanup(nginx.terminate)
        for _ in range(200):
            try:
                return self.get("/healthz")
            except ConnectionError:
                time.sleep(0.05)
        self.fail("nginx does not start")

    def build(self, pixels):
        source = geotiff(os.path.join(self.folder, "source.tif"), pixels)
        draft = os.path.join(self.folder, "draft.pyr")
        subprocess.run([TOOL, "build", source, draft, "--overwrite", "-q"], check=True)
        make_old(draft)
        os.replace(draft, os.path.join(self.data, "a.pyr"))

    def get(self, path, headers={}):
        connection = http.client.HTTPConnection("127.0.0.1", self.port, timeout=30)
        connection.request("GET", path, headers=headers)
        answer = connection.getresponse()
        body = answer.read()
        connection.close()
        return answer.status, dict(answer.headers), body

    def made(self):
        """Answers with a body that the servers have given so far, those about themselves too."""
        return sum(int(line.split()[1]) for server in self.servers
                   for line in server.get("/metrics")[2].decode().splitlines()
                   if line.startswith('zmcraster_requests_total{status="2xx"}'))

    def test_tiles_are_kept_and_asked_for_again_by_their_tag(self):
        path = "/tiles/a.pyr/0/0/0.png"
        first = self.get(path)
        self.assertEqual((first[0], first[1]["X-Cache"]), (200, "MISS"))
        self.assertEqual(self.get(path)[1]["X-Cache"], "HIT")
        time.sleep(2.2)
        before = self.made()
        again = self.get(path)
        # One that is asked for by its tag is not made again.
        self.assertEqual((again[0], again[1]["X-Cache"], again[2]), (200, "REVALIDATED", first[2]))
        self.assertEqual(self.made() - before, 2)
        self.assertEqual(self.get(path, {"If-None-Match": first[1]["ETag"]})[0], 304)

    def test_a_file_that_is_replaced_shows_in_the_cache(self):
        path = "/tiles/a.pyr/1/0/0.raw"
        self.get(path)
        self.build(np.full((700, 900, 3), 7, np.uint8))
        time.sleep(2.2)
        status, headers, body = self.get(path)
        self.assertEqual((status, headers["X-Cache"]), (200, "EXPIRED"))
        self.assertEqual(set(body), {7})

    def test_one_server_of_two_is_enough(self):
        self.servers[0].process.terminate()
        self.servers[0].process.wait(20)
        for x in range(2):
            self.assertEqual(self.get(f"/tiles/a.pyr/1/{x}/0.jpg")[0], 200)

    def test_ranges_of_files_go_through(self):
        data = pathlib.Path(self.data, "a.pyr").read_bytes()
        status, headers, body = self.get("/files/a.pyr", {"Range": "bytes=100-199"})
        self.assertEqual((status, body), (206, data[100:200]))
        self.assertEqual(headers["Content-Range"], f"bytes 100-199/{len(data)}")


if __name__ == "__main__":
    unittest.main()
