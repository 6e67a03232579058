"""A web server of a test's own: it writes down each request, and fails as it is told to."""
import email.utils
import hashlib
import os
import re
import threading
import time
from http.server import BaseHTTPRequestHandler, ThreadingHTTPServer


class Request:
    def __init__(self, method, path, range_, sent=0):
        self.method, self.path, self.range, self.sent = method, path, range_, sent

    def __repr__(self):
        return f"{self.method} {self.path} {self.range}"


class Handler(BaseHTTPRequestHandler):
    protocol_version = "HTTP/1.1"
    disable_nagle_algorithm = True

    def log_message(self, *_):
        pass

    def range_of(self, size):
        found = re.fullmatch(r"bytes=(\d+)-(\d*)", self.headers.get("Range", ""))
        if not found or not self.server.ranges:
            return None
        last = int(found[2]) if found[2] else size - 1
        return int(found[1]), min(last, size - 1)

    def answer(self, status, headers=(), body=b"", length=None):
        self.send_response(status)
        for name, value in headers:
            self.send_header(name, value)
        self.send_header("Content-Length", str(len(body) if length is None else length))
        self.end_headers()
        if self.command == "HEAD":
            return
        try:
            for start in range(0, len(body), 1 << 20):
                # Before, so that whoever has got it finds it counted.
                self.log_entry.sent += len(body[start:start + (1 << 20)])
                self.wfile.write(body[start:start + (1 << 20)])
        except OSError:
            self.close_connection = True

    def serve(self):
        server = self.server
        path = self.path.split("?")[0]
        name = os.path.join(server.folder, path.lstrip("/"))
        self.log_entry = Request(self.command, path, self.headers.get("Range"))
        self.log_entry.headers = dict(self.headers)
        with server.lock:
            server.log.append(self.log_entry)
            self.number = len(server.log)  # since the last look at the log
        if server.delay:
            time.sleep(server.delay)
        fault = server.fault(self) if server.fault else None
        if fault == "drop":
            self.close_connection = True
            self.connection.close()
            return
        if isinstance(fault, int):
            return self.answer(fault, body=b"no")
        if path in server.redirects:
            return self.answer(302, [("Location", server.redirects[path])])
        if not os.path.isfile(name):
            return self.answer(404, body=b"not found")
        status = os.stat(name)
        size = status.st_size
        headers = [("Accept-Ranges", "bytes" if server.ranges else "none")]
        if server.tags:
            state = f"{status.st_ino}-{status.st_mtime_ns}-{size}"
            headers.append(("ETag", '"%s"' % hashlib.md5(state.encode()).hexdigest()))
        if server.dates:
            headers.append(("Last-Modified", email.utils.formatdate(status.st_mtime, usegmt=True)))
        if self.command == "HEAD":
            return self.answer(200, headers, length=size)
        part = self.range_of(size)
        first, last = part or (0, size - 1)
        if first >= size:
            return self.answer(416, [("Content-Range", f"bytes */{size}")])
        if part:
            total = server.claims or size
            headers.append(("Content-Range", f"bytes {first}-{last}/{total}"))
        with open(name, "rb") as stream:
            stream.seek(first)
            body = stream.read(last - first + 1)
        if fault == "short":
            self.close_connection = True
            return self.answer(206 if part else 200, headers, body[:len(body) // 2], len(body))
        if fault == "less":
            return self.answer(206 if part else 200, headers, body[:len(body) // 2])
        if fault == "other":
            body = body[::-1]
            headers[-1] = ("Content-Range", f"bytes {first + 1}-{last + 1}/{size + 1}")
        return self.answer(206 if part else 200, headers, body)

    do_GET = do_HEAD = serve


class Server(ThreadingHTTPServer):
    """Serves a folder. `fault(handler)` answers None, a status, "drop", "short", "less", "other"."""
    daemon_threads = True
    request_queue_size = 64

    def __init__(self, folder, delay=0.0):
        super().__init__(("127.0.0.1", 0), Handler)
        self.folder, self.delay = folder, delay
        self.ranges = self.tags = self.dates = True
        self.claims = None
        self.fault = None
        self.redirects = {}
        self.log = []
        self.lock = threading.Lock()
        self.url = f"http://127.0.0.1:{self.server_address[1]}/"
        threading.Thread(target=self.serve_forever, args=(0.01,), daemon=True).start()

    def handle_error(self, *_):
        pass

    def take(self):
        """The requests since the last call."""
        with self.lock:
            taken, self.log = self.log, []
        return taken

    def stop(self):
        self.shutdown()
        self.server_close()
