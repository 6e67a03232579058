"""The server as a stranger finds it: what is asked for wrongly, or with bad intent, has the documented answer."""
import json
import os
import pathlib
import re
import shutil
import socket
import subprocess
import tempfile
import time
import unittest

import numpy as np

from server_test import TOOL, Server, geotiff, make_old, samples

HOST = b"Host: here\r\n"


class Answer:
    def __init__(self, status, headers, body, whole):
        self.status, self.headers, self.body, self.whole = status, headers, body, whole


class Stream:
    """A connection that sends bytes as they are, and takes answers apart."""

    def __init__(self, server, wait=5):
        self.socket = socket.create_connection(("127.0.0.1", server.port), timeout=wait)
        self.data = bytearray()
        self.ended = False

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self.socket.close()

    def send(self, data):
        try:
            self.socket.sendall(data)
        except ConnectionError:
            pass

    def more(self):
        try:
            part = self.socket.recv(1 << 16)
        except (ConnectionError, socket.timeout):
            part = b""
        self.ended = self.ended or not part
        self.data += part
        return bool(part)

    def answer(self, head_only=False):
        """The next answer; None where the server sends none, or not a whole head."""
        while b"\r\n\r\n" not in self.data:
            if not self.more():
                return None
        end = self.data.index(b"\r\n\r\n")
        head = bytes(self.data[:end])
        del self.data[:end + 4]
        lines = head.decode("latin-1").split("\r\n")
        headers = {}
        for line in lines[1:]:
            name, value = line.split(":", 1)
            headers.setdefault(name.lower(), value.strip())
        status = int(lines[0].split()[1])
        length = 0 if head_only or status in (100, 204, 304) else int(headers["content-length"])
        while len(self.data) < length and self.more():
            pass
        body = bytes(self.data[:length])
        del self.data[:length]
        return Answer(status, headers, body, len(body) == length)

    def rest(self):
        """All that comes until the server ends the connection, or is silent."""
        while self.more():
            pass
        return bytes(self.data)


def resident(server):
    with open(f"/proc/{server.process.pid}/status", encoding="ascii") as status:
        line = next(line for line in status if line.startswith("VmRSS"))
    return int(line.split()[1]) / 1024


class AbuseTest(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.top = tempfile.mkdtemp(prefix="zmcabuse")
        cls.addClassCleanup(shutil.rmtree, cls.top)
        cls.folder = os.path.join(cls.top, "served")
        os.makedirs(os.path.join(cls.folder, "sub"))
        cls.build(os.path.join(cls.folder, "a.pyr"), samples("Byte", 300, 400, 3))
        for name in ("served/sub/b.pyr", "outside.pyr"):
            shutil.copy2(os.path.join(cls.folder, "a.pyr"), os.path.join(cls.top, name))
        cls.server = cls.enterClassContext(Server(cls.folder, "-q"))

    @classmethod
    def build(cls, path, pixels, type_name="Byte", options=()):
        source = geotiff(os.path.join(cls.top, "source.tif"), pixels, type_name)
        subprocess.run([TOOL, "build", source, path, "--overwrite", "-q", *options], check=True)
        os.remove(source)
        make_old(path)

    def setUp(self):
        self.assertIsNone(self.server.process.poll())

    def tearDown(self):
        self.assertEqual(self.ask(b"GET /healthz HTTP/1.1\r\n" + HOST + b"\r\n").status, 200)

    def ask(self, data, wait=5):
        with Stream(self.server, wait) as stream:
            stream.send(data)
            return stream.answer(data.startswith(b"HEAD"))

    def get(self, target, *headers):
        lines = b"".join(header + b"\r\n" for header in headers)
        return self.ask(b"GET " + target + b" HTTP/1.1\r\n" + HOST + lines + b"\r\n")

    def assertRefused(self, answer, statuses, what):
        """One line of printable text, which nobody keeps or takes for something else."""
        self.assertIsNotNone(answer, what)
        self.assertIn(answer.status, statuses, what)
        self.assertTrue(answer.whole, what)
        self.assertRegex(answer.body, rb"\A[\x20-\x7e]+\n\Z", what)
        self.assertTrue(answer.headers["content-type"].startswith("text/plain"), what)
        self.assertEqual(answer.headers["x-content-type-options"], "nosniff", what)

    # --- names ---

    def test_no_encoding_of_the_folder_above_leads_out(self):
        above = (b"..", b"%2e%2e", b"%2E%2e", b".%2e", b"%2e.", b"%252e%252e", b"%25252e%25252e",
                 b"..%00", b"%00..", b"%c0%ae%c0%ae", b"%e0%80%ae%e0%80%ae", b"%uff0e%uff0e",
                 b"%ef%bc%8e%ef%bc%8e", b"..;", b"..%3b", b"...", b"....", b"..%20", b"..%09",
                 b"..%0d%0a", b".", b"%2e", b"")
        slashes = (b"/", b"%2f", b"%2F", b"%5c", b"\\", b"%252f", b"%c0%af", b"//", b"/./")
        for service, end in ((b"files", b""), (b"info", b""), (b"tiles", b"/0/0/0.raw"),
                             (b"preview", b".png"), (b"window", b".npy"), (b"point", b""),
                             (b"view", b"")):
            for up in above:
                for slash in slashes:
                    for front in (b"", b"sub" + slash + up + slash):
                        name = front + up + slash + b"outside.pyr"
                        target = b"/" + service + b"/" + name + end
                        answer = self.get(target)
                        self.assertRefused(answer, (400, 403, 404), target)
                        self.assertNotIn(b"KOBT", answer.body)

    def test_names_of_other_places_are_nowhere(self):
        outside = os.path.join(self.top, "outside.pyr")
        for name in (outside, "/" + outside, "//" + outside, "file://" + outside, "~/a.pyr",
                     "/proc/self/environ", "/dev/zero", "/vsimem/a.pyr", "/vsicurl/http://a/b.pyr",
                     "/vsizip//a.zip/b.pyr", "http://127.0.0.1/a.pyr", "MEM:::DATAPOINTER=1",
                     "a.pyr::$DATA", "a.pyr.", "a.pyr ", "A.PYR", "*.pyr", "?.pyr", "a.pyr;b",
                     "{a}.pyr", "$(id)", "`id`", "%n%s%x", "-version"):
            encoded = "".join(f"%{byte:02X}" for byte in os.fsencode(name)).encode()
            for target in (b"/files/" + encoded, b"/info/" + encoded,
                           b"/tiles/" + encoded + b"/0/0/0.jpg"):
                self.assertRefused(self.get(target), (400, 403, 404), name)

    def test_links_lead_nowhere_but_to_what_is_served(self):
        links = {"out.pyr": "../outside.pyr", "absolute.pyr": os.path.join(self.folder, "a.pyr"),
                 "folder": "..", "loop.pyr": "loop.pyr", "gone.pyr": "nothing.pyr",
                 "in.pyr": "sub/b.pyr", "sub/up.pyr": "../a.pyr", "proc": "/proc/self/root",
                 "around.pyr": "sub/../../served/a.pyr"}
        for name, target in links.items():
            os.symlink(target, os.path.join(self.folder, name))
            self.addCleanup(os.remove, os.path.join(self.folder, name))
        for name, statuses in (("out.pyr", (403,)), ("absolute.pyr", (403,)), ("loop.pyr", (403,)),
                               ("gone.pyr", (404,)), ("folder/outside.pyr", (403,)),
                               ("folder/served/a.pyr", (403,)), ("around.pyr", (403,)),
                               (f"proc{self.top}/outside.pyr", (403,))):
            for target in (f"/files/{name}", f"/info/{name}", f"/tiles/{name}/0/0/0.raw"):
                self.assertRefused(self.get(target.encode()), statuses, target)
        for name in ("in.pyr", "sub/up.pyr"):
            self.assertEqual(self.get(f"/info/{name}".encode()).status, 200, name)
        listed = self.get(b"/api").body.decode()
        for name in ("out.pyr", "absolute.pyr", "loop.pyr", "around.pyr", "folder", "proc"):
            self.assertNotIn(name, listed)
        with Server(self.folder, "-q", "--follow-links") as server:
            for name in ("out.pyr", "absolute.pyr", "in.pyr", "folder/outside.pyr"):
                self.assertEqual(server.get(f"/info/{name}")[0], 200, name)

    def test_names_of_any_bytes_are_found_or_refused(self):
        for byte in range(256):
            for form in (b"/files/%%%02x" % byte, b"/files/a%%%02xb.pyr" % byte,
                         b"/tiles/%%%02x/0/0/0.png" % byte, b"/info/a.pyr%%%02x" % byte):
                self.assertRefused(self.get(form), (400, 403, 404), form)
        for name in (b"line\nfeed.pyr", b"quote\"<script>'&.pyr", b"\xff\xfe\x80.pyr", b"\x7f\x01.pyr",
                     b"%2e%2e.pyr", b"a?b#c.pyr", b"back\\slash.pyr", b"+ .pyr"):
            path = os.fsencode(self.folder) + b"/" + name
            shutil.copy2(os.path.join(self.folder, "a.pyr"), path)
            self.addCleanup(os.remove, path)
            encoded = "".join(f"%{byte:02X}" for byte in name).encode()
            for target in (b"/files/" + encoded, b"/tiles/" + encoded + b"/0/0/0.png",
                           b"/info/" + encoded, b"/tiles/" + encoded + b"/tile.json"):
                self.assertEqual(self.get(target).status, 200, target)
        page, listed = self.get(b"/"), self.get(b"/api")
        self.assertNotIn(b"<script>'&", page.body)
        self.assertEqual(len(json.loads(listed.body)["files"]), 10)

    def test_bytes_that_no_address_has_are_refused(self):
        for target in (b"/files/a.pyr%", b"/files/a.pyr%0", b"/files/a.pyr%zz", b"/%", b"/?%",
                       b"/preview/a.pyr.png?size=%", b"/preview/a.pyr.png?%00=1",
                       b"/preview/a.pyr.png?size=%00", b"/preview/a.pyr.png?size=1&size=2",
                       b"/files/\x80\xff", b"/files/a.pyr?x=1%", b"*", b"a.pyr", b"?", b"#"):
            self.assertRefused(self.get(target), (400, 404), target)

    # --- numbers ---

    def test_numbers_of_every_size_and_sign_are_judged(self):
        numbers = (b"-1", b"-0", b"+1", b"%2B1", b"4294967295", b"4294967296", b"2147483648",
                   b"18446744073709551615", b"18446744073709551616", b"9" * 400, b"0x10", b"1e9",
                   b"1.5", b"nan", b"inf", b"-inf", b"", b"%20", b"1%20", b"01e", b"\xef\xbc\x91",
                   b"1,1", b"--1")
        for number in numbers:
            for target in (b"/tiles/a.pyr/%s/0/0.png", b"/tiles/a.pyr/0/%s/0.raw",
                           b"/tiles/a.pyr/0/0/%s.npy", b"/preview/a.pyr.png?size=%s",
                           b"/preview/a.pyr.png?window=%s,0,9,9", b"/preview/a.pyr.jpg?quality=%s",
                           b"/window/a.pyr.raw?window=0,0,%s,9", b"/window/a.pyr.raw?bands=%s",
                           b"/window/a.pyr.raw?window=0,0,1,1&level=%s", b"/point/a.pyr?x=%s&y=0",
                           b"/histogram/a.pyr?band=%s", b"/profile/a.pyr?line=0,0,%s",
                           b"/profile/a.pyr?line=0,0,9,9&samples=%s",
                           b"/view/a.pyr?screen=%s,9", b"/view/a.pyr?screen=9,9&at=%s,1&zoom=1",
                           b"/view/a.pyr?screen=9,9&at=1,1&zoom=%s"):
                answer = self.get(target % number)
                self.assertIsNotNone(answer, target % number)
                if answer.status != 200:
                    self.assertRefused(answer, (400, 404), target % number)
                self.assertLess(len(answer.body), 1 << 20, target % number)

    def test_more_than_may_be_asked_for_is_refused_at_once(self):
        begin = time.monotonic()
        for target in (b"/preview/a.pyr.png?size=8193", b"/preview/a.pyr.webp?size=65535",
                       b"/profile/a.pyr?line=0,0,9,9&samples=8193",
                       b"/window/a.pyr.raw?bands=" + b",".join([b"1"] * 600),
                       b"/point/a.pyr?x=0&y=0&bands=" + b",".join([b"4"] * 100)):
            self.assertRefused(self.get(target), (400,), target[:60])
        self.assertLess(time.monotonic() - begin, 3)

    # --- ranges ---

    def test_ranges_of_every_malformed_kind_give_the_whole_file(self):
        size = os.path.getsize(os.path.join(self.folder, "a.pyr"))
        for value in (b"", b"bytes", b"bytes=", b"bytes= ", b"bytes=-", b"bytes=--1", b"bytes=a-b",
                      b"bytes=1", b"bytes=5-1", b"bytes=0x1-2", b"bytes=1-2-3", b"bytes=1.5-2",
                      b"bytes=+1-2", b"bytes=1-+2", b"bytes=-+5", b"bits=0-1", b"seconds=1-2",
                      b"0-1", b"=0-1", b"bytes 0-1", b"bytes:0-1", b"bytes=0-1;q=1", b"bytes=0-1,x",
                      b"bytes=0-1,2-3", b"bytes=" + b"0-1," * 300 + b"5-6", b"bytes=,", b"none"):
            answer = self.get(b"/files/a.pyr", b"Range: " + value)
            self.assertEqual((answer.status, len(answer.body)), (200, size), value)
            self.assertNotIn("content-range", answer.headers)

    def test_ranges_outside_of_the_file_are_not_satisfiable(self):
        size = os.path.getsize(os.path.join(self.folder, "a.pyr"))
        for value in (b"bytes=%d-" % size, b"bytes=%d-%d" % (size, size + 9), b"bytes=-0",
                      b"bytes=18446744073709551615-", b"bytes=" + b"9" * 300 + b"-",
                      b"bytes=99999999999-99999999999"):
            answer = self.get(b"/files/a.pyr", b"Range: " + value)
            self.assertRefused(answer, (416,), value)
            self.assertEqual(answer.headers["content-range"], f"bytes */{size}")

    def test_ranges_that_reach_beyond_the_file_end_with_it(self):
        data = pathlib.Path(self.folder, "a.pyr").read_bytes()
        for value, part in ((b"bytes=0-" + b"9" * 300, data), (b"bytes=-" + b"9" * 30, data),
                            (b"bytes=%d-18446744073709551615" % (len(data) - 1), data[-1:]),
                            (b"BYTES = 0-0", None), (b"bytes=0-0", data[:1]),
                            (b"bytes=0-0,", data[:1]), (b" bytes=2-3 ", data[2:4])):
            answer = self.get(b"/files/a.pyr", b"Range: " + value)
            self.assertEqual(answer.body, data if part is None else part, value)
            self.assertEqual(answer.status, 200 if part is None else 206, value)

    def test_conditions_of_every_malformed_kind_are_no_conditions_or_fail(self):
        for name in (b"If-None-Match", b"If-Modified-Since", b"If-Range"):
            for value in (b"", b"\"", b"W/", b"W/\"", b"a", b"\"a", b",,,", b"\"" + b"a" * 4000 + b"\"",
                          b"Sun, 99 Foo 2026 99:99:99 GMT", b"Thu, 01 Jan 1970 00:00:00 GMT"):
                answer = self.get(b"/files/a.pyr", name + b": " + value, b"Range: bytes=0-9")
                self.assertIn(answer.status, (200, 206), (name, value))
        for value in (b"\"", b"a", b"\"a\"", b"W/\"a\""):
            answer = self.get(b"/files/a.pyr", b"If-Match: " + value)
            self.assertRefused(answer, (412,), value)

    # --- requests ---

    def test_an_address_may_begin_with_the_server_it_is_meant_for(self):
        for front in (b"http://here", b"HTTP://other.example:80", b"https://[::1]:1"):
            for target, status in ((b"/healthz", 200), (b"/files/a.pyr?x", 200), (b"", 200),
                                   (b"?a=b", 200), (b"/files/..%2foutside.pyr", 400)):
                answer = self.get(front + target)
                self.assertEqual(answer.status, status, front + target)
        for target in (b"ftp://here/healthz", b"http:/healthz", b"http:///healthz", b"here:80",
                       b"http://", b"javascript:alert(1)"):
            self.assertRefused(self.get(target), (400,), target)

    def test_other_methods_are_refused_by_name(self):
        for method in (b"POST", b"PUT", b"DELETE", b"PATCH", b"TRACE", b"CONNECT", b"PROPFIND", b"get",
                       b"GETT", b"G", b"X" * 500):
            answer = self.ask(method + b" /api HTTP/1.1\r\n" + HOST + b"\r\n")
            self.assertRefused(answer, (405,), method)
            self.assertIn("GET", answer.headers["allow"])

    def test_a_body_of_any_kind_is_refused_and_ends_the_connection(self):
        inner = b"GET /healthz HTTP/1.1\r\n" + HOST + b"\r\n"
        for lines in (b"Transfer-Encoding: chunked\r\n", b"Transfer-Encoding: gzip\r\n",
                      b"Transfer-Encoding: chunked, chunked\r\n", b"Transfer-Encoding: x\r\n",
                      b"Transfer-Encoding : chunked\r\n", b"Transfer-Encoding:\x0bchunked\r\n",
                      b"Content-Length: 5\r\nTransfer-Encoding: chunked\r\n",
                      b"Content-Length: 36\r\n", b"Content-Length: 1\r\nContent-Length: 36\r\n",
                      b"Content-Length: 36\r\nContent-Length: 0\r\n", b"Content-Length: -1\r\n",
                      b"Content-Length: +36\r\n", b"Content-Length: 0x24\r\n",
                      b"Content-Length: 36, 36\r\n", b"Content-Length: " + b"9" * 30 + b"\r\n"):
            with self.subTest(lines=lines), Stream(self.server, 2) as stream:
                stream.send(b"GET /api HTTP/1.1\r\n" + HOST + lines + b"\r\n0\r\n\r\n" + inner)
                answer = stream.answer()
                if answer is not None:
                    self.assertIn(answer.status, (400, 413, 501))
                self.assertNotIn(b"200 OK", stream.rest())
                self.assertTrue(stream.ended)

    def test_a_body_of_a_megabyte_is_not_waited_for(self):
        for method, status in ((b"GET", 413), (b"POST", 405), (b"PUT", 405)):
            with Stream(self.server) as stream:
                begin = time.monotonic()
                stream.send(method + b" /api HTTP/1.1\r\n" + HOST + b"Content-Length: 1000000\r\n\r\n")
                self.assertRefused(stream.answer(), (status,), method)
                stream.send(b"a" * 1000000)
                self.assertLess(time.monotonic() - begin, 3)

    def test_who_waits_for_leave_to_send_a_body_gets_an_answer(self):
        lines = b"Expect: 100-continue\r\n"
        with Stream(self.server, 3) as stream:
            stream.send(b"GET /healthz HTTP/1.1\r\n" + HOST + lines + b"\r\n")
            answers = [stream.answer() for _ in range(2)]
            statuses = [answer.status for answer in answers if answer is not None]
            self.assertIn(statuses, ([200], [100, 200]))
        with Stream(self.server, 3) as stream:
            stream.send(b"GET /api HTTP/1.1\r\n" + HOST + lines + b"Content-Length: 9\r\n\r\n")
            self.assertRefused(stream.answer(), (413,), lines)
        self.assertIn(self.get(b"/healthz", b"Expect: something-else").status, (200, 417))

    def test_requests_behind_each_other_are_answered_in_their_order(self):
        targets = [b"/healthz", b"/tiles/a.pyr/0/0/0.png", b"/nothing", b"/files/a.pyr",
                   b"/tiles/a.pyr/1/0/0.raw", b"/api", b"/info/a.pyr", b"/preview/a.pyr.jpg"] * 12
        wanted = {target: self.get(target) for target in set(targets)}
        with Stream(self.server) as stream:
            stream.send(b"".join(b"GET " + target + b" HTTP/1.1\r\n" + HOST + b"\r\n"
                                 for target in targets))
            for target in targets:
                answer = stream.answer()
                self.assertEqual((answer.status, answer.body),
                                 (wanted[target].status, wanted[target].body), target)

    def test_requests_come_in_parts_of_any_size(self):
        request = b"GET /tiles/a.pyr/0/0/0.raw HTTP/1.1\r\n" + HOST + b"\r\n"
        for step in (1, 7):
            with Stream(self.server) as stream:
                stream.socket.setsockopt(socket.IPPROTO_TCP, socket.TCP_NODELAY, 1)
                for at in range(0, len(request), step):
                    stream.send(request[at:at + step])
                    time.sleep(0.002)
                self.assertEqual(stream.answer().status, 200)

    def test_version_one_point_zero_is_answered_and_ended(self):
        for request in (b"GET /healthz HTTP/1.0\r\n\r\n", b"GET /files/a.pyr HTTP/1.0\r\n" + HOST + b"\r\n",
                        b"HEAD /files/a.pyr HTTP/1.0\r\n\r\n", b"GET /tiles/a.pyr/0/0/0.jpg HTTP/1.0\r\n\r\n"):
            with Stream(self.server) as stream:
                stream.send(request)
                answer = stream.answer(request.startswith(b"HEAD"))
                self.assertEqual((answer.status, answer.whole or request.startswith(b"HEAD")),
                                 (200, True))
                self.assertEqual(stream.rest(), b"")

    def test_lines_that_are_no_request_are_refused(self):
        for data in (b"GET  /healthz HTTP/1.1\r\n", b"GET /healthz\r\n", b"GET\r\n", b"/healthz\r\n",
                     b"GET /healthz HTTP/2.0\r\n", b"GET /healthz HTTP/1.1 x\r\n",
                     b"GET /healthz http/1.1\r\n", b"GET /healthz HTTP/1.\r\n", b"\0\0\0\0\r\n",
                     b"GET\t/healthz\tHTTP/1.1\r\n", b"\x16\x03\x01\x02\x00\x01\x00\x01\xfc\x03\x03",
                     b"PRI * HTTP/2.0\r\n\r\nSM\r\n\r\n", b"GET /a b HTTP/1.1\r\n",
                     b"GET /\0 HTTP/1.1\r\n", b"GET /a\rb HTTP/1.1\r\n"):
            with self.subTest(data=data), Stream(self.server, 1) as stream:
                stream.send(data + HOST + b"\r\n")
                answer = stream.answer()
                if answer is not None and answer.status != 200:
                    self.assertIn(answer.status, (400, 404, 405, 505))
                self.assertNotIn(b"root:", stream.rest())

    def test_bombs_of_headers_are_refused(self):
        bombs = (b"X: " + b"a" * 1000000 + b"\r\n", b"a" * 1000000 + b": x\r\n",
                 b"X: a\r\n" * 10000, b"X: a\r\n" + b" b\r\n" * 100000,
                 b"".join(b"X-%d: a\r\n" % i for i in range(150)), b"Cookie: " + b"a=b; " * 9000 + b"\r\n")
        for bomb in bombs:
            with self.subTest(bomb=bomb[:20]), Stream(self.server, 3) as stream:
                stream.send(b"GET /api HTTP/1.1\r\n" + HOST + bomb + b"\r\n")
                answer = stream.answer()
                if answer is not None:
                    self.assertIn(answer.status, (400, 413, 431, 494))
                self.assertEqual(stream.rest(), b"")

    def test_headers_of_odd_forms_do_no_harm(self):
        for line in (b"no colon\r\n", b": empty\r\n", b"X:\r\n", b"X: \x01\x02\r\n", b"X: \xff\r\n",
                     b"X: a\0b\r\n", b"X: a\nY: b\r\n", b":\r\n" * 5000, b" X: a\r\n", b"Host: second\r\n",
                     b"X: a\r\n b\r\n", b"\tX: a\r\n", b"Range: bytes=0-1\r\nRange: bytes=2-3\r\n",
                     b"Accept-Encoding: " + b"gzip;q=" + b"9" * 500 + b"\r\n",
                     b"Accept-Encoding: gzip;q=nan, zstd;q=-1e400, *;q=\r\n", b"Connection: a, b, close, c\r\n",
                     b"Upgrade: h2c\r\nConnection: Upgrade\r\nHTTP2-Settings: AAAA\r\n"):
            with self.subTest(line=line), Stream(self.server, 2) as stream:
                stream.send(b"GET /info/a.pyr HTTP/1.1\r\n" + HOST + line + b"\r\n")
                answer = stream.answer()
                if answer is not None:
                    self.assertIn(answer.status, (200, 206, 400))
                    self.assertTrue(answer.whole)

    def test_names_that_no_header_can_have_are_refused(self):
        for line in (b"Transfer-Encoding : chunked", b"X : a", b"X\t: a", b"(X): a", b"X@Y: a", b"X/Y: a",
                     b"X Y: a", b"X\x7f: a", b"\xc3\xa4: a"):
            self.assertRefused(self.get(b"/healthz", line), (400,), line)

    def test_addresses_of_a_megabyte_are_refused(self):
        for target in (b"/" + b"a" * 1000000, b"/" + b"a/" * 500000, b"/api?" + b"a=b&" * 250000,
                       b"/files/" + b"%41" * 300000):
            with Stream(self.server, 3) as stream:
                stream.send(b"GET " + target + b" HTTP/1.1\r\n" + HOST + b"\r\n")
                answer = stream.answer()
                if answer is not None:
                    self.assertIn(answer.status, (400, 414, 431))
                self.assertEqual(stream.rest(), b"")
        for target, statuses in ((b"/" + b"a" * 8192, (414,)), (b"/" + b"a/" * 65, (400,)),
                                 (b"/api?" + b"a=b&" * 65, (400,))):
            self.assertRefused(self.get(target), statuses, target[:20])

    # --- clients that go, or half go ---

    def test_clients_that_close_their_half_are_answered_or_ended(self):
        for target in (b"/healthz", b"/files/a.pyr", b"/tiles/a.pyr/0/0/0.png"):
            with Stream(self.server) as stream:
                stream.send(b"GET " + target + b" HTTP/1.1\r\n" + HOST + b"\r\n")
                stream.socket.shutdown(socket.SHUT_WR)
                answer = stream.answer()
                if answer is not None:
                    self.assertEqual(answer.status, 200, target)
                self.assertEqual(stream.rest(), b"")
                self.assertTrue(stream.ended)

    def opened(self):
        """Connections that the server has, but for the one that asks, and requests that wait."""
        told = self.get(b"/metrics").body.decode()
        return [int(re.search(rf"^zmcraster_{name} (\d+)", told, re.M).group(1)) - own
                for name, own in (("connections", 1), ("waiting", 0))]

    def test_clients_that_go_while_an_answer_is_made_cost_nothing_that_stays(self):
        before = self.opened()[0]
        for target in (b"/preview/a.pyr.webp?size=400", b"/files/a.pyr", b"/tiles/a.pyr/1/0/0.raw"):
            for _ in range(50):
                stream = Stream(self.server)
                stream.socket.setsockopt(socket.SOL_SOCKET, socket.SO_LINGER, b"\1\0\0\0\0\0\0\0")
                stream.send((b"GET " + target + b" HTTP/1.1\r\n" + HOST + b"\r\n") * 3)
                stream.socket.close()
        end = time.monotonic() + 20
        while time.monotonic() < end:
            connections, waiting = self.opened()
            if connections <= before and waiting == 0:
                return
            time.sleep(0.1)
        self.fail(f"{connections} connections and {waiting} requests stay")

    # --- files that change under an answer ---

    def stream_of(self, server, name):
        """A client that has the head and the first bytes of a file, and takes no more for now."""
        stream = Stream(server, 10)
        stream.socket.close()
        stream.socket = socket.socket()
        stream.socket.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 4096)
        stream.socket.settimeout(10)
        stream.socket.connect(("127.0.0.1", server.port))
        stream.send(b"GET /files/" + name + b" HTTP/1.1\r\n" + HOST + b"\r\n")
        while b"\r\n\r\n" not in stream.data:
            stream.more()
        return stream

    def large(self):
        path = os.path.join(self.folder, "large.pyr")
        self.build(path, np.full((2048, 2048, 3), 7, np.uint8))
        self.addCleanup(lambda: os.path.exists(path) and os.remove(path))
        return path

    def test_a_file_that_is_replaced_or_removed_is_sent_to_its_end(self):
        path = self.large()
        data = pathlib.Path(path).read_bytes()
        with self.stream_of(self.server, b"large.pyr") as stream:
            draft = path + ".draft"
            shutil.copy2(os.path.join(self.folder, "a.pyr"), draft)
            os.replace(draft, path)
            self.assertEqual(self.get(b"/files/large.pyr").body,
                             pathlib.Path(self.folder, "a.pyr").read_bytes())
            answer = stream.answer()
            self.assertTrue(answer.whole and answer.body == data)
        self.large()
        with self.stream_of(self.server, b"large.pyr") as stream:
            os.remove(path)
            self.assertRefused(self.get(b"/files/large.pyr"), (404,), "it is gone")
            answer = stream.answer()
            self.assertTrue(answer.whole and answer.body == data)

    def test_a_file_that_is_cut_breaks_its_answer_off(self):
        path = self.large()
        with self.stream_of(self.server, b"large.pyr") as stream:
            os.truncate(path, 1 << 20)
            answer = stream.answer()
            self.assertFalse(answer.whole, "more was sent than there was")
            self.assertEqual(stream.rest(), b"")

    # --- files that claim much ---

    def test_a_file_whose_table_would_need_gigabytes_is_served_in_little_memory(self):
        path = os.path.join(self.folder, "huge.pyr")
        self.build(path, samples("Byte", 300, 300, 9))
        self.addCleanup(os.remove, path)
        data = pathlib.Path(path).read_bytes()
        start = int.from_bytes(data[4:12], "little")
        text = data[20:start].decode()
        self.assertIn("Morton", text)
        for name in ("WIDTH", "HEIGHT"):
            text = re.sub(f"(<HEADER_PIXEL_{name}>)300<", r"\g<1>16777216<", text)
        start = 20 + len(text)
        with open(path, "wb") as file:
            file.write(data[:4] + start.to_bytes(8, "little") + (1 << 60).to_bytes(8, "little") +
                       text.encode())
            file.truncate(1 << 42)
        make_old(path)
        before = resident(self.server)
        begin = time.monotonic()
        for target in (b"/info/huge.pyr", b"/files/huge.pyr", b"/tiles/huge.pyr/tile.json",
                       b"/tiles/huge.pyr/0/0/0.png", b"/tiles/huge.pyr/1/0/0.raw",
                       b"/point/huge.pyr?x=9999999&y=9999999", b"/preview/huge.pyr.png",
                       b"/statistics/huge.pyr", b"/window/huge.pyr.raw?window=16777000,16777000,9,9"):
            answer = self.get(target, b"Range: bytes=0-99")
            self.assertIsNotNone(answer, target)
            self.assertIn(answer.status, (200, 206, 400, 404, 500, 503), target)
            if answer.status >= 400:
                self.assertRefused(answer, (400, 404, 500, 503), target)
        self.assertLess(time.monotonic() - begin, 60)
        if "ZMC_SANITIZED" not in os.environ:
            self.assertLess(resident(self.server) - before, 256)


if __name__ == "__main__":
    unittest.main()
