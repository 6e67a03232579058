"""Load: wrk, as fast as it goes; requests at a given rate, whatever becomes of them; a codec alone."""
import collections
import ctypes
import ctypes.util
import json
import mmap
import multiprocessing
import os
import random
import re
import select
import socket
import subprocess
import time
import urllib.parse

SCRIPT = """
local counter = 0
local requests, at, pause = {}, 0, 0
function setup(thread) thread:set("id", counter) counter = counter + 1 end
function init(args)
  pause = tonumber(args[3])
  for line in io.lines(args[1]) do
    local path, range = line:match("([^\\t]*)\\t(.*)")
    local headers = {Host = "localhost"}
    if range ~= "" then headers["Range"] = range end
    requests[#requests + 1] = wrk.format("GET", path, headers)
  end
  at = math.floor(id * #requests / tonumber(args[2]))
  math.randomseed(id + 1)
  if pause > 0 then function delay() return math.random(0, 2 * pause) end end
end
function request() at = at % #requests + 1 return requests[at] end
function done(summary, latency)
  io.write(string.format('{"requests": %d, "microseconds": %d, "bytes": %d, "bad": %d, "broken": %d, "p99": %d}\\n',
    summary.requests, summary.duration, summary.bytes, summary.errors.status,
    summary.errors.connect + summary.errors.read + summary.errors.write + summary.errors.timeout,
    latency:percentile(99)))
end
"""


class Wrk:
    def __init__(self, folder, threads=2, connections=16):
        self.folder, self.threads, self.connections = folder, threads, connections
        self.script = os.path.join(folder, "wrk.lua")
        with open(self.script, "w", encoding="ascii") as file:
            file.write(SCRIPT)

    def start(self, url, requests, seconds, pause=0):
        """`pause`: milliseconds between the requests of a connection, on the average."""
        path = os.path.join(self.folder, "wrk.requests")
        with open(path, "w", encoding="ascii") as file:
            for request in requests:
                file.write(f"{request.path}\t{request.headers.get('Range', '')}\n")
        return subprocess.Popen(
            ["wrk", "-t", str(self.threads), "-c", str(self.connections), "-d", f"{round(seconds)}s",
             "-s", self.script, url, "--", path, str(self.threads), str(pause)],
            stdout=subprocess.PIPE, text=True)

    def run(self, url, requests, seconds, processes=()):
        """Answers a second, and answers for each second that a processor was at work for it: wrk's, and that of
        the processes of the server. Whatever is not answered well is an error."""
        before = work_of(processes) + work_of_children()
        text = self.start(url, requests, seconds).communicate()[0]
        work = work_of(processes) + work_of_children() - before
        told = json.loads(re.search(r"^\{.*\}$", text, re.M).group())
        if told["bad"] or told["broken"]:
            raise RuntimeError(f"{url}: {told}")
        return Rate(told["requests"] / told["microseconds"] * 1e6, told["requests"] / work)


Rate = collections.namedtuple("Rate", "answers per_work")


def work_of(processes):
    """Seconds that processors were at work for them, and for those that they have started and that live."""
    total = 0
    for process in processes:
        try:
            with open(f"/proc/{process}/stat", encoding="ascii") as file:
                fields = file.read().rsplit(")", 1)[1].split()
            with open(f"/proc/{process}/task/{process}/children", encoding="ascii") as file:
                children = file.read().split()
        except FileNotFoundError:
            continue
        total += (int(fields[11]) + int(fields[12])) / os.sysconf("SC_CLK_TCK") + work_of(children)
    return total


def work_of_children():
    """The same of those that have ended."""
    times = os.times()
    return times.children_user + times.children_system


# --- at a given rate ---

Outcome = collections.namedtuple("Outcome", "status seconds")


class Client:
    """One connection, with one request at a time."""

    def __init__(self, address):
        self.socket = socket.create_connection(address)
        self.socket.setsockopt(socket.IPPROTO_TCP, socket.TCP_NODELAY, 1)
        self.socket.setblocking(False)
        self.due = None
        self.left = 0
        self.status = 0
        self.head = b""

    def take(self):
        """Whether the answer is whole."""
        data = self.socket.recv(1 << 18)
        if not data:
            raise ConnectionError("the server ended a connection")
        if self.status == 0:
            self.head += data
            end = self.head.find(b"\r\n\r\n")
            if end < 0:
                return False
            self.status = int(self.head[9:12])
            length = re.search(rb"\r\ncontent-length: *(\d+)", self.head[:end + 2], re.I)
            self.left = int(length.group(1)) - (len(self.head) - end - 4)
            self.head = b""
        else:
            self.left -= len(data)
        return self.left == 0


def at_rate(url, requests, rate, seconds, connections=256):
    """Requests come by chance, `rate` a second on the average, and do not wait for each other: times count
    from the moment at which a request should have gone out."""
    parts = urllib.parse.urlsplit(url)
    lines = [f"GET {request.path} HTTP/1.1\r\nHost: localhost\r\n\r\n".encode()
             for request in requests]
    clients = [Client((parts.hostname, parts.port)) for _ in range(connections)]
    poll = select.epoll()
    by_number = {}
    for client in clients:
        poll.register(client.socket.fileno(), select.EPOLLIN)
        by_number[client.socket.fileno()] = client
    idle, outcomes, chance = collections.deque(clients), [], random.Random(2)
    sent, waiting = 0, collections.deque()
    begin = time.perf_counter()
    due, end, lost = begin + chance.expovariate(rate), begin + seconds, begin + seconds + 10
    while True:
        now = time.perf_counter()
        while due <= now and due < end:
            waiting.append(due)
            due += chance.expovariate(rate)
        while waiting and idle:
            client = idle.popleft()
            client.due, client.status = waiting.popleft(), 0
            client.socket.send(lines[sent % len(lines)])
            sent += 1
        if due >= end and not waiting and len(idle) == len(clients):
            break
        if now > lost:
            raise RuntimeError("answers did not come")
        pause = 0 if waiting and idle else max(min(due, lost) - time.perf_counter(), 0)
        for number, _ in poll.poll(pause if due < end else 0.1):
            client = by_number[number]
            if client.take():
                outcomes.append(Outcome(client.status, time.perf_counter() - client.due))
                idle.append(client)
    for client in clients:
        client.socket.close()
    poll.close()
    return outcomes


def percentile(values, share):
    ordered = sorted(values)
    return ordered[min(int(share * len(ordered)), len(ordered) - 1)] if ordered else None


# --- a codec alone ---

def _encode(path, tile_bytes, quality, seconds, first, queue):
    """libjpeg-turbo in a loop on pixels in memory, without anything around it."""
    codec = ctypes.CDLL(ctypes.util.find_library("turbojpeg") or "libturbojpeg.so.0")
    codec.tjInitCompress.restype = ctypes.c_void_p
    codec.tjBufSize.restype = ctypes.c_ulong
    rgb, halved, no_room = 0, 2, 1024
    handle = ctypes.c_void_p(codec.tjInitCompress())
    side = int((tile_bytes // 3) ** 0.5)
    room = codec.tjBufSize(side, side, halved)
    buffer = (ctypes.c_ubyte * room)()
    target = ctypes.cast(buffer, ctypes.POINTER(ctypes.c_ubyte))
    with open(path, "rb") as file:
        pixels = mmap.mmap(file.fileno(), 0, access=mmap.ACCESS_COPY)
    base = ctypes.addressof(ctypes.c_char.from_buffer(pixels))
    count = len(pixels) // tile_bytes
    places = [ctypes.c_void_p(base + i * tile_bytes) for i in range(count)]
    compress, to, size = codec.tjCompress2, ctypes.byref(target), ctypes.c_ulong()
    for warm in range(4):
        compress(handle, places[warm % count], side, 0, side, rgb, to, ctypes.byref(size), halved,
                 quality, no_room)
    done, at = 0, first % count
    begin, work = time.perf_counter(), time.process_time()
    end = begin + seconds
    while time.perf_counter() < end:
        size.value = room
        if compress(handle, places[at], side, 0, side, rgb, to, ctypes.byref(size), halved, quality,
                    no_room):
            raise RuntimeError("the codec fails")
        done += 1
        at = (at + 1) % count
    queue.put((done, time.perf_counter() - begin, time.process_time() - work))


def codec_alone(path, tile_bytes, quality, seconds, workers):
    """Tiles a second by so many processes, and tiles for each second of work."""
    queue = multiprocessing.Queue()
    jobs = [multiprocessing.Process(target=_encode,
                                    args=(path, tile_bytes, quality, seconds, 97 * i, queue))
            for i in range(workers)]
    for job in jobs:
        job.start()
    results = [queue.get(timeout=seconds + 60) for _ in jobs]
    for job in jobs:
        job.join()
    return Rate(sum(done / took for done, took, _ in results),
                sum(done for done, _, _ in results) / sum(work for _, _, work in results))
