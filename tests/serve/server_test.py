"""The server as a program, over HTTP: what its library without a socket cannot show."""
import concurrent.futures
import contextlib
import gzip
import http.client
import io
import json
import os
import pathlib
import re
import resource
import shutil
import signal
import socket
import subprocess
import sys
import tempfile
import time
import unittest
import urllib.parse

import numpy as np

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parent.parent / "tools"))
from frame import TOOL, TYPES, geotiff, samples  # noqa: E402
from pyramid import Pyramid  # noqa: E402


class Server:
    """zmcraster serve on a port of its own."""

    def __init__(self, *arguments, files=None):
        self.errors = tempfile.TemporaryFile()
        limit = (lambda: resource.setrlimit(resource.RLIMIT_NOFILE, (files, files))) if files else None
        self.process = subprocess.Popen([TOOL, "serve", "--port", "0", *map(str, arguments)],
                                        stdout=subprocess.PIPE, stderr=self.errors,
                                        preexec_fn=limit)
        self.url = self.process.stdout.readline().decode().strip()
        assert self.url.startswith("http://127.0.0.1:"), self.said()
        self.port = int(self.url.rstrip("/").rsplit(":", 1)[1])

    def said(self):
        self.errors.seek(0)
        return self.errors.read().decode()

    def __enter__(self):
        return self

    def __exit__(self, *_):
        if self.process.poll() is None:
            self.process.terminate()
        assert self.process.wait(30) == 0, self.said()
        self.process.stdout.close()
        self.errors.close()

    def connect(self):
        return http.client.HTTPConnection("127.0.0.1", self.port, timeout=30)

    def get(self, path, headers={}, method="GET"):
        connection = self.connect()
        try:
            connection.request(method, path, headers=headers)
            answer = connection.getresponse()
            return answer.status, dict(answer.headers), answer.read()
        finally:
            connection.close()

    def send(self, data, wait=10):
        """What comes back for raw bytes, until the server ends the connection or falls silent."""
        answer = b""
        with socket.create_connection(("127.0.0.1", self.port), timeout=wait) as stream:
            # A server that refuses early ends the connection while the rest is being sent.
            with contextlib.suppress(ConnectionError):
                stream.sendall(data)
            try:
                while part := stream.recv(1 << 16):
                    answer += part
                    if b"GET" in data and answer.endswith(b"\n") and b"close" not in answer:
                        break
            except (ConnectionError, socket.timeout):
                pass
            return answer


def make_old(path):
    os.utime(path, (time.time() - 3600,) * 2)


class ServerTest(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.folder = tempfile.mkdtemp(prefix="zmcserve")
        cls.addClassCleanup(shutil.rmtree, cls.folder)
        cls.build("a.pyr", samples("Byte", 700, 900, 3))
        cls.server = cls.enterClassContext(Server(cls.folder))

    @classmethod
    def path(cls, name):
        return os.path.join(cls.folder, name)

    @classmethod
    def build(cls, name, pixels, type_name="Byte", options=()):
        source = geotiff(cls.path("source.tif"), pixels, type_name)
        subprocess.run([TOOL, "build", source, cls.path(name), "--overwrite", "-q", *options],
                       check=True)
        os.remove(source)
        make_old(cls.path(name))
        return cls.path(name)

    # --- what is sent ---

    def test_raw_and_numpy_tiles_of_all_types_in_three_orderings_are_those_of_the_file(self):
        for type_name in TYPES:
            for ordering, bands in (("scanline", 2), ("blocked", 2), ("auto", 9)):
                with self.subTest(type=type_name, ordering=ordering):
                    self.build("t.pyr", samples(type_name, 150, 300, bands), type_name,
                               ("--ordering", ordering))
                    reader = Pyramid(self.path("t.pyr"))
                    self.assertEqual((reader.type_name, reader.ordering.lower()),
                                     (type_name, "morton" if bands == 9 else ordering))
                    for level in range(reader.level_max + 1):
                        whole = reader.read(level)
                        across, down = reader.tiles(level)
                        for x in range(across):
                            for y in range(down):
                                tile = whole[y * 256:(y + 1) * 256, x * 256:(x + 1) * 256]
                                at = f"/tiles/t.pyr/{reader.level_max - level}/{x}/{y}"
                                raw = self.server.get(at + ".raw")[2]
                                self.assertEqual(raw, np.ascontiguousarray(tile).tobytes())
                                array = np.load(io.BytesIO(self.server.get(at + ".npy")[2]))
                                self.assertEqual(array.dtype, reader.type)
                                self.assertEqual(array.tobytes(), raw)
                                self.assertEqual(array.shape, tile.shape)

    def test_curl_gets_the_bytes_that_it_asks_for(self):
        data = pathlib.Path(self.path("a.pyr")).read_bytes()
        url = self.server.url + "files/a.pyr"
        for wanted, part in (("0-9", data[:10]), ("100-", data[100:]), ("-7", data[-7:]),
                             ("5-5", data[5:6])):
            got = subprocess.run(["curl", "-sS", "-r", wanted, url], capture_output=True, check=True)
            self.assertEqual(got.stdout, part)
        half = self.path("half")
        pathlib.Path(half).write_bytes(data[:1000])
        subprocess.run(["curl", "-sS", "-C", "-", "-o", half, url], check=True)
        self.assertEqual(pathlib.Path(half).read_bytes(), data)

    def test_a_304_has_no_length_that_could_be_taken_for_that_of_the_file(self):
        _, headers, _ = self.server.get("/files/a.pyr", {"Range": "bytes=0-1"})
        status, again, body = self.server.get("/files/a.pyr", {"If-None-Match": headers["ETag"]})
        self.assertEqual((status, body), (304, b""))
        self.assertNotIn("Content-Length", again)
        self.assertEqual(again["ETag"], headers["ETag"])

    def test_a_304_ends_with_its_head(self):
        """What came behind it would be taken for the next answer."""
        tag = self.server.get("/files/a.pyr", {"Range": "bytes=0-1"})[1]["ETag"]
        with socket.create_connection(("127.0.0.1", self.server.port), timeout=5) as stream:
            stream.sendall(f"GET /files/a.pyr HTTP/1.1\r\nHost: a\r\nIf-None-Match: {tag}\r\n\r\n".encode())
            got = b""
            try:
                while part := stream.recv(1 << 16):
                    got += part
                    if b"\r\n\r\n" in got:
                        stream.settimeout(0.5)
            except socket.timeout:
                pass
        self.assertTrue(got.startswith(b"HTTP/1.1 304 "))
        self.assertEqual(got.split(b"\r\n\r\n", 1)[1], b"")
        self.assertNotIn(b"\r\nTransfer-Encoding:", got)

    def test_head_has_the_length_and_no_body(self):
        for path in ("/files/a.pyr", "/tiles/a.pyr/0/0/0.png", "/api"):
            whole = self.server.get(path)
            status, headers, body = self.server.get(path, method="HEAD")
            self.assertEqual((status, body), (200, b""))
            self.assertEqual(headers["Content-Length"], str(len(whole[2])))

    def test_documents_and_samples_are_compressed_for_those_who_take_it(self):
        for path in ("/info/a.pyr", "/window/a.pyr.npy?window=0,0,64,64&bands=1"):
            plain = self.server.get(path)
            status, headers, body = self.server.get(path, {"Accept-Encoding": "gzip"})
            self.assertEqual(status, 200)
            self.assertEqual(headers["Vary"], "Accept-Encoding")
            if "Content-Encoding" in headers:
                self.assertEqual(gzip.decompress(body), plain[2])
                self.assertNotEqual(headers["ETag"], plain[1]["ETag"])
                known = {"Accept-Encoding": "gzip", "If-None-Match": headers["ETag"]}
                self.assertEqual(self.server.get(path, known)[0], 304)
        self.assertEqual(self.server.get("/info/a.pyr", {"Accept-Encoding": "zstd"})[1]
                         ["Content-Encoding"], "zstd")

    def test_info_is_what_the_command_prints(self):
        printed = json.loads(subprocess.run([TOOL, "info", "a.pyr", "--json"], cwd=self.folder,
                                            capture_output=True, check=True).stdout)
        self.assertEqual(json.loads(self.server.get("/info/a.pyr")[2]), printed)

    def test_previews_are_those_of_the_command(self):
        picture = self.path("picture.png")
        subprocess.run([TOOL, "preview", self.path("a.pyr"), picture, "--size", "100", "--bands",
                        "2", "--colormap", "turbo", "--overwrite", "-q"], check=True)
        served = self.server.get("/preview/a.pyr.png?size=100&bands=2&colormap=turbo")[2]
        self.assertEqual(served, pathlib.Path(picture).read_bytes())

    def test_one_connection_serves_many_requests(self):
        connection = self.server.connect()
        for path in ("/healthz", "/tiles/a.pyr/0/0/0.jpg", "/nothing", "/files/a.pyr") * 5:
            connection.request("GET", path)
            answer = connection.getresponse()
            answer.read()
            self.assertIsNone(answer.getheader("Connection"))
        connection.close()

    # --- bad requests ---

    def test_malformed_requests_are_refused_and_leave_the_server_well(self):
        host = b"Host: a\r\n"
        for data in (b"\r\n\r\n", b"\0" * 100, b"GET\r\n\r\n", b"GET /api HTTP/9.9\r\n\r\n",
                     b"GET /api HTTP/1.1\r\n\r\n", b"GET ftp://x/ HTTP/1.1\r\n" + host + b"\r\n",
                     b"GET /%zz HTTP/1.1\r\n" + host + b"\r\n",
                     b"GET /" + b"a" * 1000000 + b" HTTP/1.1\r\n" + host + b"\r\n",
                     b"GET /api HTTP/1.1\r\n" + host + b"X: " + b"a" * 1000000 + b"\r\n\r\n",
                     b"GET /api HTTP/1.1\r\n" + host + b"X: a\r\n" * 1000 + b"\r\n",
                     b"POST /api HTTP/1.1\r\n" + host + b"Content-Length: 1000000\r\n\r\n" +
                     b"a" * 1000000):
            answer = self.server.send(data, wait=3)
            if answer:
                self.assertRegex(answer[:12], rb"^HTTP/1\.[01] (4|505)")
        self.assertEqual(self.server.get("/healthz")[0], 200)

    def test_a_long_address_and_many_headers_have_statuses_of_their_own(self):
        self.assertEqual(self.server.get("/" + "a" * 9000)[0], 414)
        self.assertEqual(self.server.get("/api", {f"X-{i}": "a" for i in range(150)})[0], 431)

    def test_a_body_is_never_taken_for_the_next_request(self):
        inner = b"GET /healthz HTTP/1.1\r\nHost: a\r\n\r\n"
        for method, status in ((b"GET", b"413"), (b"POST", b"405")):
            answer = self.server.send(method + b" /api HTTP/1.1\r\nHost: a\r\nContent-Length: " +
                                      str(len(inner)).encode() + b"\r\n\r\n" + inner)
            self.assertEqual(answer.count(b"HTTP/1.1 "), 1)
            self.assertEqual(answer[9:12], status)

    def test_silent_and_slow_clients_are_ended(self):
        with Server(self.path("a.pyr"), "--idle", "1") as server:
            streams = [socket.create_connection(("127.0.0.1", server.port)) for _ in range(3)]
            streams[1].sendall(b"GET /api HTTP/1.1\r\n")
            begin = time.monotonic()
            ended = set()
            while len(ended) < 3 and time.monotonic() - begin < 8:
                try:
                    streams[2].sendall(b"G" if 2 not in ended else b"")
                except ConnectionError:
                    ended.add(2)
                for i in {0, 1, 2} - ended:
                    streams[i].settimeout(0.1)
                    try:
                        if not streams[i].recv(1000):
                            ended.add(i)
                    except socket.timeout:
                        pass
                    except ConnectionError:
                        ended.add(i)
            self.assertEqual(ended, {0, 1, 2})
            for stream in streams:
                stream.close()

    def test_ten_thousand_connections_or_what_open_files_allow_are_held_and_the_server_answers(self):
        soft, hard = resource.getrlimit(resource.RLIMIT_NOFILE)
        resource.setrlimit(resource.RLIMIT_NOFILE, (hard, hard))
        # The server keeps half of its open files for what is sent.
        count = min(10000, (hard - 512) // 2 - 20)
        streams = []
        try:
            with Server(self.path("a.pyr"), "-q", "--connections", "10100") as server:
                for _ in range(count):
                    streams.append(socket.create_connection(("127.0.0.1", server.port)))
                begin = time.monotonic()
                self.assertEqual(server.get("/healthz")[0], 200)
                self.assertEqual(server.get("/tiles/a.pyr/0/0/0.jpg")[0], 200)
                self.assertLess(time.monotonic() - begin, 5)
                with open(f"/proc/{server.process.pid}/status", encoding="ascii") as status:
                    held = [line for line in status if line.startswith("VmRSS")][0].split()[1]
                if "ZMC_SANITIZED" not in os.environ:
                    self.assertLess(int(held), 512 << 10)
        finally:
            for stream in streams:
                stream.close()
            resource.setrlimit(resource.RLIMIT_NOFILE, (soft, hard))

    def test_clients_that_do_not_read_cost_little_and_others_are_answered(self):
        data = pathlib.Path(self.path("a.pyr")).read_bytes()
        head = b"GET /files/a.pyr HTTP/1.1\r\nHost: a\r\nRange: bytes=0-249999\r\n\r\n"
        with Server(self.path("a.pyr"), "-q") as server:
            streams = []
            for _ in range(100):
                stream = socket.socket()
                stream.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 4096)
                stream.connect(("127.0.0.1", server.port))
                stream.sendall(head * 30)
                streams.append(stream)
            for start in (0, 1000):
                wanted = {"Range": f"bytes={start}-{start + 249999}"}
                self.assertEqual(server.get("/files/a.pyr", wanted)[2], data[start:start + 250000])
            with open(f"/proc/{server.process.pid}/status", encoding="ascii") as status:
                held = [line for line in status if line.startswith("VmRSS")][0].split()[1]
            if "ZMC_SANITIZED" not in os.environ:
                self.assertLess(int(held), 128 << 10)
            for stream in streams:
                stream.close()

    def test_without_open_files_it_says_so_and_recovers(self):
        with Server(self.path("a.pyr"), files=64) as server:
            streams = [socket.create_connection(("127.0.0.1", server.port)) for _ in range(80)]
            for stream in streams:
                stream.close()
            time.sleep(0.5)
            self.assertEqual(server.get("/tiles/a.pyr/0/0/0.png")[0], 200)

    # --- too much at once ---

    def test_what_is_too_much_is_refused_with_503_and_health_is_told_all_the_same(self):
        with Server(self.folder, "--threads", "1", "--queue", "1") as server:
            with concurrent.futures.ThreadPoolExecutor(24) as pool:
                work = [pool.submit(server.get, f"/preview/a.pyr.webp?size=900&quality={i + 70}")
                        for i in range(24)]
                self.assertEqual(server.get("/healthz")[0], 200)
                answers = [job.result() for job in work]
            statuses = [answer[0] for answer in answers]
            self.assertEqual(set(statuses), {200, 503})
            refused = answers[statuses.index(503)]
            self.assertEqual(refused[1]["Retry-After"], "1")
            self.assertEqual(refused[2].count(b"\n"), 1)
            self.assertRegex(server.get("/metrics")[2].decode(), r"zmcraster_refused_total [1-9]")

    # --- files that change ---

    def test_a_file_that_is_replaced_again_and_again_is_never_mixed(self):
        first = self.build("r1.pyr", np.full((600, 600, 3), 10, np.uint8))
        second = self.build("r2.pyr", np.full((600, 600, 3), 200, np.uint8))
        live = self.path("live.pyr")
        shutil.copyfile(first, live)
        end = time.monotonic() + 2
        seen = set()

        def replace():
            turn = 0
            while time.monotonic() < end:
                turn += 1
                draft = self.path("draft")
                shutil.copyfile(second if turn % 2 else first, draft)
                make_old(draft)
                os.replace(draft, live)
                time.sleep(0.005)

        def look(path):
            while time.monotonic() < end:
                status, _, body = self.server.get(path)
                self.assertIn(status, (200, 503))
                if status == 200:
                    values = set(np.frombuffer(body, np.uint8)) if "raw" in path else {body}
                    self.assertEqual(len(values), 1)
                    seen.add((path, *map(hash, values)))

        with concurrent.futures.ThreadPoolExecutor() as pool:
            jobs = [pool.submit(replace)] + [
                pool.submit(look, path) for path in
                ("/tiles/live.pyr/1/0/0.raw", "/tiles/live.pyr/0/0/0.png",
                 "/window/live.pyr.raw?window=0,0,400,400")]
            for job in jobs:
                job.result()
        self.assertEqual(len(seen), 6)

    def test_files_that_are_damaged_or_go_are_told_and_others_served_on(self):
        victim = self.build("v.pyr", samples("Byte", 600, 600, 3))
        self.assertEqual(self.server.get("/tiles/v.pyr/1/1/1.png")[0], 200)
        os.truncate(victim, 40000)
        for path in ("/tiles/v.pyr/1/1/1.png", "/tiles/v.pyr/1/1/1.raw"):
            self.assertIn(self.server.get(path)[0], (404, 500, 503))
        os.truncate(victim, 30)
        self.assertEqual(self.server.get("/info/v.pyr")[0], 500)
        os.truncate(victim, 0)
        self.assertEqual(self.server.get("/info/v.pyr")[0], 404)
        os.remove(victim)
        self.assertEqual(self.server.get("/files/v.pyr")[0], 404)
        self.assertEqual(self.server.get("/tiles/a.pyr/0/0/0.png")[0], 200)

    # --- the program ---

    def test_it_ends_well_and_finishes_what_is_under_way(self):
        for number in (signal.SIGTERM, signal.SIGINT):
            server = Server(self.path("a.pyr"))
            with concurrent.futures.ThreadPoolExecutor() as pool:
                work = pool.submit(server.get, "/preview/a.pyr.webp?size=900")
                time.sleep(0.15)
                idle = socket.create_connection(("127.0.0.1", server.port))
                server.process.send_signal(number)
                self.assertEqual(work.result()[0], 200)
            with server:
                self.assertEqual(server.process.wait(10), 0)
            idle.close()

    def test_the_log_has_a_line_for_each_request(self):
        log = self.path("access.log")
        with Server(self.path("a.pyr"), "--access-log", log) as server:
            server.get("/healthz")
            server.get("/a%22b\"c", {"Range": "bytes=0-1"})
        lines = pathlib.Path(log).read_text(encoding="ascii").splitlines()
        self.assertEqual(len(lines), 2)
        self.assertRegex(lines[0], r'^127\.0\.0\.1 - - \[.*\] "GET /healthz HTTP/1\.1" 200 3 \d+$')
        self.assertRegex(lines[1], r'"GET /a%22b\\x22c HTTP/1\.1" 404 \d+ \d+$')

    def test_the_log_has_what_the_http_library_answered_by_itself(self):
        log = self.path("refused.log")
        with Server(self.path("a.pyr"), "--access-log", log) as server:
            told = []
            for target, head in ((b"/big", b"Host: a\r\nX: " + b"a" * 100000),
                                 (b"/nohost", b"X: a"), (b"/two", b"Host: a\r\nHost: b\r\n b: c")):
                answer = server.send(b"GET " + target + b" HTTP/1.1\r\n" + head + b"\r\n\r\n", wait=3)
                self.assertRegex(answer[:12], rb"^HTTP/1\.[01] [45]")
                told.append((target.decode(), int(answer[9:12])))
        lines = pathlib.Path(log).read_text(encoding="ascii").splitlines()
        logged = [re.search(r'"\S+ (/\S+) \S+" (\d+) ', line).groups() for line in lines]
        self.assertEqual([(target, int(status)) for target, status in logged], told)

    def test_open_shows_a_single_file_at_once_and_else_all(self):
        folder = self.path("open")
        os.makedirs(os.path.join(folder, "bin"))
        opener = os.path.join(folder, "bin", "xdg-open")
        with open(opener, "w", encoding="utf-8") as script:
            script.write(f'#!/bin/sh\nprintf %s "$1" >"{folder}/told.part"\n'
                         f'mv "{folder}/told.part" "{folder}/told"\n')
        os.chmod(opener, 0o755)
        name = "a b%&#é.pyr"
        shutil.copy(self.path("a.pyr"), os.path.join(folder, name))
        path = os.environ["PATH"]
        os.environ["PATH"] = os.path.dirname(opener) + os.pathsep + path
        self.addCleanup(os.environ.update, {"PATH": path})

        def opened(*named):
            with Server("--open", *named) as server:
                deadline = time.monotonic() + 10
                while not os.path.exists(folder + "/told") and time.monotonic() < deadline:
                    time.sleep(0.02)
                page = pathlib.Path(folder, "told").read_text(encoding="utf-8")
                os.remove(folder + "/told")
                self.assertTrue(page.startswith(server.url))
                query = urllib.parse.parse_qs(urllib.parse.urlsplit(page).query)
                self.assertEqual(server.get(urllib.parse.urlsplit(page).path)[0], 200)
                for file in query.get("file", []):
                    self.assertEqual(server.get("/" + file)[0], 200)
                    self.assertEqual(urllib.parse.unquote(file), "files/" + name)
                return query

        self.assertIn("file", opened(os.path.join(folder, name)))
        self.assertEqual(opened(folder), {})
        self.assertEqual(opened(os.path.join(folder, name), self.path("a.pyr")), {})

    def test_links_begin_as_the_client_calls_the_server_or_as_is_told(self):
        link = json.loads(self.server.get("/api", {"Host": "maps.example:80"})[2])["files"][0]["url"]
        self.assertTrue(link.startswith("http://maps.example:80/files/"))
        link = json.loads(self.server.get("/api", {"Host": "a\"><b"})[2])["files"][0]["url"]
        self.assertTrue(link.startswith(self.server.url))
        with Server(self.path("a.pyr"), "--base-url", "https://b.example/x/") as server:
            link = json.loads(server.get("/api")[2])["files"][0]["url"]
            self.assertEqual(link, "https://b.example/x/files/a.pyr")

    def test_what_cannot_be_served_is_told_when_it_starts(self):
        for arguments in (["nothing"], ["/dev/null"], ["/vsimem/a.pyr"], ["http://a/b.pyr"],
                          [self.folder, "--port", "70000"], [self.folder, "--host", "192.0.2.1"],
                          [self.folder, "--port", str(self.server.port)], []):
            done = subprocess.run([TOOL, "serve", *arguments], capture_output=True, timeout=30,
                                  check=False)
            self.assertIn(done.returncode, (1, 2), arguments)
            self.assertEqual(done.stdout, b"")
            self.assertTrue(done.stderr.startswith(b"zmcraster: "))
            self.assertEqual(done.stderr.count(b"\n"), 1)


if __name__ == "__main__":
    unittest.main()
