"""Stores for the tests of targets in object stores: one from npm, which knows who may ask, and one of our own, which
keeps everything in memory, looks at signatures, ends uploads, and misbehaves as it is told. Both are reached over
loopback alone."""
import hashlib
import hmac
import http.server
import os
import pathlib
import shutil
import subprocess
import tempfile
import threading
import urllib.parse

KEYS = {"AWS_ACCESS_KEY_ID": "S3RVER", "AWS_SECRET_ACCESS_KEY": "S3RVER"}


def settings(port, **more):
    """What the environment tells of a store on this port."""
    return {**KEYS, "AWS_S3_ENDPOINT": f"127.0.0.1:{port}", "AWS_HTTPS": "NO", "AWS_VIRTUAL_HOSTING": "NO",
            "AWS_REGION": "us-east-1", "GDAL_HTTP_RETRY_DELAY": "0.02", "GDAL_HTTP_MAX_RETRY": "3",
            "NO_PROXY": "127.0.0.1", **more}


class NpmStore:
    """Objects are files of their folder, which the tests read and write by the store's own requests alone."""

    def __init__(self):
        self.folder = tempfile.mkdtemp(prefix="zmcstore")
        script = pathlib.Path(__file__).with_name("serve.cjs")
        self.process = subprocess.Popen(["node", script, self.folder], stdin=subprocess.PIPE, stdout=subprocess.PIPE,
                                        text=True)
        self.port = int(self.process.stdout.readline())

    def close(self):
        self.process.stdin.close()
        self.process.wait()
        self.process.stdout.close()
        shutil.rmtree(self.folder)

    def settings(self, **more):
        return settings(self.port, **more)


def error(code, message):
    return (f'<?xml version="1.0"?><Error><Code>{code}</Code><Message>{message}</Message></Error>').encode()


def signature(method, address, headers, secret):
    """What a request is signed with: its Authorization header has the rest of it."""
    scope, names, _ = (each.split("=", 1)[1] for each in headers["Authorization"].split(" ", 1)[1].split(", "))
    scope, names = scope.split("/")[1:], names.split(";")
    query = "&".join(sorted(address.query.split("&")))
    lines = [f"{name}:{headers[name].strip()}\n" for name in names]
    asked = "\n".join((method, address.path, query, "".join(lines), ";".join(names), headers["x-amz-content-sha256"]))
    text = "\n".join(("AWS4-HMAC-SHA256", headers["x-amz-date"], "/".join(scope),
                      hashlib.sha256(asked.encode()).hexdigest()))
    key = ("AWS4" + secret).encode()
    for word in (*scope, text):
        key = hmac.new(key, word.encode(), hashlib.sha256).digest()
    return key.hex()


class Handler(http.server.BaseHTTPRequestHandler):
    protocol_version = "HTTP/1.1"

    def log_message(self, *_):
        pass

    def answer(self, status, body=b"", headers=None):
        self.send_response(status)
        for name, value in (headers or {}).items():
            self.send_header(name, value)
        self.send_header("Content-Length", str(len(body)))
        self.end_headers()
        if self.command != "HEAD":
            self.wfile.write(body)

    def handle_one_request(self):
        try:
            super().handle_one_request()
        except (BrokenPipeError, ConnectionResetError):
            self.close_connection = True

    def serve(self):
        store = self.server.store
        address = urllib.parse.urlsplit(self.path)
        self.query = dict(urllib.parse.parse_qsl(address.query, keep_blank_values=True))
        self.key = urllib.parse.unquote(address.path)
        self.kind = ("begin" if "uploads" in self.query else
                     {"PUT": "part", "POST": "complete", "DELETE": "abort"}[self.command]
                     if "uploadId" in self.query else self.command)
        with store.lock:
            store.asked.append((self.kind, self.key, dict(self.headers)))
            fault = store.faults.get(self.kind)
            fault = fault.pop(0) if isinstance(fault, list) and fault else fault
        if callable(fault):
            fault(self)
            return
        self.body = self.rfile.read(int(self.headers.get("Content-Length", 0)))
        signed = self.headers.get("Authorization", "").rpartition("Signature=")[2]
        if signed != signature(self.command, address, self.headers, store.secret):
            self.answer(403, error("SignatureDoesNotMatch", "look at your key"))
            return
        with store.lock:
            self.answer(*store.take(self))

    do_GET = do_HEAD = do_PUT = do_POST = do_DELETE = serve


class OwnStore:
    """faults: by the kind of a request (begin, part, complete, abort, HEAD, PUT, DELETE) what answers in place of the
    store, or a list of that for one request after the other."""

    def __init__(self):
        self.lock = threading.Lock()
        self.faults = {}
        self.secret = KEYS["AWS_SECRET_ACCESS_KEY"]
        self.asked = []
        self.objects = {}  # bytes and mark
        self.uploads = {}  # key, mark, parts
        self.server = http.server.ThreadingHTTPServer(("127.0.0.1", 0), Handler)
        self.server.daemon_threads = True
        self.server.store = self
        self.port = self.server.server_address[1]
        self.thread = threading.Thread(target=self.server.serve_forever, daemon=True)
        self.thread.start()

    def close(self):
        self.server.shutdown()
        self.server.server_close()

    def settings(self, **more):
        return settings(self.port, **more)

    def count(self, kind):
        return sum(each[0] == kind for each in self.asked)

    def take(self, request):
        if not request.key.startswith("/maps/"):
            return 404, error("NoSuchBucket", "The specified bucket does not exist")
        mark = request.headers.get("x-amz-meta-zmcraster", "")
        if request.kind == "begin":
            upload = f"upload-{len(self.uploads)}+/="
            self.uploads[upload] = request.key, mark, {}
            return 200, f"<R><UploadId>{upload}</UploadId></R>".encode()
        if request.kind in ("part", "complete", "abort"):
            upload = request.query["uploadId"]
            if upload not in self.uploads:
                return 404, error("NoSuchUpload", "The specified upload does not exist")
            return getattr(self, request.kind)(request, upload)
        if request.kind == "DELETE":
            self.objects.pop(request.key, None)
            return 204, b""
        if request.kind == "PUT":
            self.objects[request.key] = request.body, mark
        if request.key not in self.objects:
            return 404, b""
        content, mark = self.objects[request.key]
        return 200, b"", {"ETag": f'"{hashlib.md5(content).hexdigest()}"', "x-amz-meta-zmcraster": mark}

    def part(self, request, upload):
        if hashlib.sha256(request.body).hexdigest() != request.headers["x-amz-content-sha256"]:
            return 400, error("XAmzContentSHA256Mismatch", "other bytes")
        tag = f'"{hashlib.md5(request.body).hexdigest()}"'
        self.uploads[upload][2][int(request.query["partNumber"])] = tag, request.body
        return 200, b"", {"ETag": tag}

    def complete(self, request, upload):
        key, mark, parts = self.uploads[upload]
        named = request.body.decode().replace("&quot;", '"').split("<PartNumber>")[1:]
        content = b""
        for each in named:
            number, tag = each.split("</PartNumber><ETag>")
            if parts.get(int(number), ("",))[0] != tag.split("</ETag>")[0]:
                return 400, error("InvalidPart", "One or more of the specified parts could not be found")
            content += parts[int(number)][1]
        self.objects[key] = content, mark
        del self.uploads[upload]
        return 200, b"<R><ETag>&quot;done&quot;</ETag></R>"

    def abort(self, _, upload):
        del self.uploads[upload]
        return 204, b""
