// What is asked of a server, and what becomes of answers that are wrong, late or of another file.
import assert from "node:assert/strict";
import { readFileSync } from "node:fs";
import { after, afterEach, before, beforeEach, test } from "node:test";

import {
  ChangedError,
  FormatError,
  HttpError,
  LimitError,
  type OpenOptions,
  Pyramid,
  RangesError,
  SourceError,
} from "zmcraster-web";

import { documentOf, fileOf, headerOf, Pyramids } from "./support/pyramids.js";
import { Server } from "./support/server.js";

const pyramids = new Pyramids();
const TILE = 64 * 64;
let server: Server;
let url: string;

before(() => {
  // Five by four tiles at level 0, all of them beyond the first 16 KiB but for those of the coarser levels.
  const sizes = { PIXEL_WIDTH: 320, PIXEL_HEIGHT: 256, LEVELMAX: 2, TILESIZE: 64 };
  pyramids.make([
    { name: "blocked", seed: 1, header: headerOf(sizes) },
    { name: "other", seed: 2, header: headerOf(sizes) },
    { name: "morton", seed: 3, header: headerOf({ ...sizes, BANDS: 12, BUILD_METHOD: "Morton" }) },
    { name: "cut", seed: 4, cut: TILE * 2 + 100, header: headerOf(sizes) },
    { name: "small", seed: 5, header: headerOf({ PIXEL_WIDTH: 40, PIXEL_HEIGHT: 30 }) },
  ]);
});
after(() => pyramids.remove());
beforeEach(async () => {
  server = new Server();
  url = await server.start();
  server.bytes = pyramids.bytes("blocked");
});
afterEach(() => server.stop());

const open = (options: OpenOptions = {}): Promise<Pyramid> => Pyramid.open(url, { retryDelay: 1, ...options });
const wait = (milliseconds: number): Promise<void> => new Promise((resolve) => setTimeout(resolve, milliseconds));
const oneLine = (error: Error): boolean => error.message.length > 0 && !error.message.includes("\n");

function is(kind: new (...rest: never[]) => Error, text = "") {
  return (error: Error): boolean => {
    assert.equal(error.constructor, kind, `${error.name}: ${error.message}`);
    assert.ok(oneLine(error));
    assert.ok(error.message.includes(text), error.message);
    return true;
  };
}

test("opening is one request of 16 KiB", async () => {
  const pyramid = await open();
  assert.deepEqual(server.log, [[0, 16383]]);
  assert.equal(pyramid.fileSize, server.bytes.length);
});

test("a longer header is one request more", async () => {
  const document = documentOf(headerOf()) + `<!--${"-x".repeat(20000)}-->`;
  server.bytes = fileOf(document, new Uint8Array(13000));
  const pyramid = await open();
  assert.deepEqual(server.log, [
    [0, 16383],
    [16384, 20 + document.length - 1],
  ]);
  assert.equal(pyramid.tileDataStart, 20 + document.length);
});

test("a file of less than 16 KiB is read by its opening alone", async () => {
  server.bytes = pyramids.bytes("small");
  const pyramid = await open();
  const { data } = await pyramid.readTile(0, 0, 0);
  await pyramid.metadata();
  assert.deepEqual(new Uint8Array(data.buffer as ArrayBuffer), pyramids.expected("small", 0));
  assert.equal(server.log.length, 1);
});

test("tiles that lie side by side are one request", async () => {
  const pyramid = await open();
  await pyramid.readWindow(0, { x: 64, y: 64, width: 192, height: 64 });
  assert.equal(server.log.length, 2);
  const [first, last] = server.log[1] as [number, number];
  assert.equal(last - first + 1, 3 * TILE);
});

test("tiles that are asked for one by one in the same turn are one request", async () => {
  const pyramid = await open();
  await Promise.all([0, 1, 2, 3, 4].map((x) => pyramid.readTile(0, x, 1)));
  assert.equal(server.log.length, 2);
});

test("gaps of up to maxGap are read along, and larger ones are not", async () => {
  const pyramid = await open({ maxGap: TILE });
  await Promise.all([pyramid.readTile(0, 0, 2), pyramid.readTile(0, 2, 2)]);
  assert.equal(server.log.length, 2);
  await Promise.all([pyramid.readTile(0, 0, 3), pyramid.readTile(0, 3, 3)]);
  assert.equal(server.log.length, 4);
});

test("no request has more than maxRequestBytes, but for a single tile", async () => {
  const pyramid = await open({ maxRequestBytes: 2 * TILE });
  await pyramid.readWindow(0, { x: 0, y: 64, width: 320, height: 64 });
  const sizes = server.log.slice(1).map(([first, last]) => (last as number) - (first as number) + 1);
  assert.deepEqual(sizes.sort(), [TILE, 2 * TILE, 2 * TILE].sort());
  const other = await open({ maxRequestBytes: 1 });
  await other.readTile(0, 0, 1);
  assert.equal(server.log.length, 6);
});

test("a band of a Morton file is read without the others", async () => {
  server.bytes = pyramids.bytes("morton");
  const pyramid = await open();
  const { data } = await pyramid.readTile(0, 4, 3, { bands: [11] });
  const [first, last] = server.log[1] as [number, number];
  assert.equal(last - first + 1, TILE);
  const expected = pyramids.expected("morton", 0);
  assert.equal(data[TILE - 1], expected[expected.length - 1]);
});

test("two callers of one tile make one request", async () => {
  const pyramid = await open();
  const [a, b] = await Promise.all([pyramid.readTile(0, 2, 2), pyramid.readTile(0, 2, 2)]);
  assert.equal(server.log.length, 2);
  assert.deepEqual(a.data, b.data);
  assert.notEqual(a.data.buffer, b.data.buffer);
});

test("a caller who comes while a request is under way waits for that one", async () => {
  const pyramid = await open();
  server.hold();
  const first = pyramid.readTile(0, 2, 2);
  await server.requests(2);
  const second = pyramid.readTile(0, 2, 2);
  await wait(10);
  server.release();
  await Promise.all([first, second]);
  assert.equal(server.log.length, 2);
});

test("tiles are kept, those used last first, and never beyond cacheBytes", async () => {
  const pyramid = await open({ cacheBytes: 2 * TILE });
  await pyramid.readTile(0, 0, 1);
  await pyramid.readTile(0, 1, 1);
  await pyramid.readTile(0, 0, 1); // of the cache, and newer than the other now
  assert.equal(server.log.length, 3);
  await pyramid.readTile(0, 2, 1);
  assert.equal(pyramid.cachedBytes, 2 * TILE);
  await pyramid.readTile(0, 0, 1);
  assert.equal(server.log.length, 4);
  await pyramid.readTile(0, 1, 1);
  assert.equal(server.log.length, 5);
  assert.equal(pyramid.cachedBytes, 2 * TILE);
});

test("without a cache nothing is kept", async () => {
  const pyramid = await open({ cacheBytes: 0 });
  await pyramid.readTile(0, 0, 1);
  assert.equal(pyramid.cachedBytes, 0);
  await pyramid.readTile(0, 0, 1);
  assert.equal(server.log.length, 3);
});

test("what a caller does to an answer changes no other answer", async () => {
  const pyramid = await open();
  const first = await pyramid.readTile<"Byte">(0, 0, 1);
  const copy = first.data.slice();
  first.data.fill(0);
  assert.deepEqual((await pyramid.readTile(0, 0, 1)).data, copy);
});

test("no more than maxRequests are under way at one time", async () => {
  const pyramid = await open({ maxRequests: 3, maxRequestBytes: 1 });
  server.hold();
  const window = pyramid.readWindow(0, { x: 0, y: 0, width: 320, height: 256 });
  await server.requests(4);
  await wait(20);
  assert.equal(server.log.length, 4);
  server.release();
  await window;
  assert.equal(server.log.length, 1 + 20);
  assert.equal(server.mostAtOnce, 3);
});

test("an abort rejects at once with its reason, and ends the request", async () => {
  const pyramid = await open();
  server.hold();
  const abort = new AbortController();
  const read = pyramid.readTile(0, 0, 1, { signal: abort.signal });
  await server.requests(2);
  const reason = new Error("enough");
  abort.abort(reason);
  await assert.rejects(read, (error) => error === reason);
  await wait(20);
  assert.equal(server.ended, 1);
  server.release();
  await pyramid.readTile(0, 0, 1); // asked for anew
  assert.equal(server.log.length, 3);
});

test("a request that is shared goes on until all who wait for it have gone", async () => {
  const pyramid = await open();
  server.hold();
  const [one, two] = [new AbortController(), new AbortController()];
  const first = pyramid.readTile(0, 0, 1, { signal: one.signal });
  const second = pyramid.readTile(0, 0, 1, { signal: two.signal });
  const beside = pyramid.readTile(0, 1, 1);
  await server.requests(2);
  one.abort();
  await assert.rejects(first, { name: "AbortError" });
  two.abort();
  await assert.rejects(second, { name: "AbortError" });
  await wait(20);
  assert.equal(server.ended, 0);
  server.release();
  await beside;
  assert.equal(server.log.length, 2);
});

test("one signal may serve many tiles and many reads", async () => {
  const warnings: Error[] = [];
  const hear = (warning: Error): void => void warnings.push(warning);
  process.on("warning", hear);
  const pyramid = await open();
  const { signal } = new AbortController();
  const whole = { x: 0, y: 0, width: 320, height: 256 };
  await Promise.all(Array.from({ length: 30 }, () => pyramid.readWindow(0, whole, { signal })));
  await wait(10);
  process.off("warning", hear);
  assert.deepEqual(warnings, []);
});

test("a window of which a part fails ends the rest of its requests", async () => {
  const pyramid = await open({ maxRequests: 2, maxRequestBytes: 1, retries: 0 });
  server.hold();
  const window = pyramid.readWindow(0, { x: 0, y: 64, width: 320, height: 64 });
  await server.requests(3);
  server.statuses.push(404);
  server.release();
  await assert.rejects(window, is(HttpError, "404"));
  await wait(20);
  assert.ok(server.log.length < 6, `${server.log.length} requests`);
});

test("what is aborted before it is asked for is never asked for", async () => {
  const pyramid = await open({ maxRequests: 1, maxRequestBytes: 1 });
  const abort = new AbortController();
  const none = pyramid.readTile(0, 0, 1, { signal: abort.signal });
  abort.abort();
  await assert.rejects(none, { name: "AbortError" });
  server.hold();
  const first = pyramid.readTile(0, 0, 2);
  const later = new AbortController();
  const queued = pyramid.readTile(0, 1, 2, { signal: later.signal });
  await server.requests(2);
  later.abort();
  await assert.rejects(queued, { name: "AbortError" });
  server.release();
  await first;
  await wait(10);
  assert.equal(server.log.length, 2);
  await assert.rejects(pyramid.readTile(0, 0, 2, { signal: AbortSignal.abort() }), { name: "AbortError" });
});

test("opening can be aborted", async () => {
  server.hold();
  const abort = new AbortController();
  const opening = open({ signal: abort.signal });
  await server.requests(1);
  abort.abort();
  await assert.rejects(opening, { name: "AbortError" });
});

test("requests ask for the file that was opened, by its tag or else by its date", async () => {
  const pyramid = await open();
  await pyramid.readTile(0, 0, 1);
  server.etag = undefined;
  const dated = await open();
  await dated.readTile(0, 0, 1);
  server.etag = 'W/"1"';
  const weak = await open();
  await weak.readTile(0, 0, 1);
  assert.deepEqual(server.validators, [undefined, '"1"', undefined, server.modified, undefined, undefined]);
});

test("a page of another origin says no If-Range, which it would have to ask for first", async () => {
  const world = globalThis as { location?: { href: string } };
  try {
    for (const href of ["http://elsewhere.example/page.html", new URL("page.html", url).href]) {
      world.location = { href };
      const pyramid = await open();
      await pyramid.readTile(0, 0, 1);
    }
  } finally {
    delete world.location;
  }
  assert.deepEqual(server.validators, [undefined, undefined, undefined, '"1"']);
});

const CHANGES: Record<string, () => void> = {
  tag: () => void (server.etag = '"2"'),
  "weak tag": () => void (server.etag = 'W/"2"'),
  date: () => void (server.modified = "Sat, 21 Nov 2026 11:00:00 GMT"),
  size: () => void (server.bytes = server.bytes.slice(0, -1)),
};

for (const [how, change] of Object.entries(CHANGES))
  for (const ifRange of [true, false])
    test(`a file that was replaced (another ${how}, If-Range ${ifRange}) is an error for good`, async () => {
      if (how === "date") server.etag = undefined;
      if (how === "weak tag") server.etag = 'W/"1"';
      const pyramid = await open({ ifRange });
      await pyramid.readTile(0, 0, 1);
      server.bytes = pyramids.bytes("other");
      change();
      const row = { x: 0, y: 64, width: 320, height: 64 };
      await assert.rejects(pyramid.readWindow(0, row), is(ChangedError));
      const count = server.log.length;
      await assert.rejects(pyramid.readTile(0, 0, 1), is(ChangedError)); // of the cache before
      await assert.rejects(pyramid.metadata(), is(ChangedError));
      assert.equal(server.log.length, count);
    });

test("a file that was replaced half-way through a window gives no window", async () => {
  const pyramid = await open({ maxRequests: 1, maxRequestBytes: 1 });
  server.hold();
  const window = pyramid.readWindow(0, { x: 0, y: 0, width: 320, height: 256 });
  await server.requests(2);
  server.release();
  await server.requests(4);
  [server.bytes, server.etag] = [pyramids.bytes("other"), '"2"'];
  await assert.rejects(window, is(ChangedError));
});

test("a file that was cut shorter than a tile is an error", async () => {
  const pyramid = await open();
  server.bytes = server.bytes.slice(0, 20000);
  await assert.rejects(pyramid.readTile(0, 4, 3), is(ChangedError));
});

test("404 and other answers that say no are errors that tell the status", async () => {
  for (const status of [404, 403, 410]) {
    server.statuses.push(status);
    await assert.rejects(open(), (error: HttpError) => is(HttpError, `${status}`)(error) && error.status === status);
  }
  assert.equal(server.log.length, 3);
});

test("failures that may pass are tried again, and others are not", async () => {
  server.statuses.push(500, 503);
  const pyramid = await open();
  server.statuses.push(-1, 429);
  await pyramid.readTile(0, 0, 1);
  server.short.push(5);
  await pyramid.readTile(0, 0, 2);
  assert.equal(server.log.length, 3 + 3 + 2);
  server.statuses.push(500, 502, 500);
  await assert.rejects(pyramid.readTile(0, 0, 3), is(HttpError, "500"));
  server.statuses.push(-1, -1, -1);
  await assert.rejects(pyramid.readTile(0, 0, 3), is(SourceError, "network"));
  server.short.push(1, 1, 1);
  await assert.rejects(pyramid.readTile(0, 0, 3), is(SourceError, "4095 bytes in place of 4096"));
  await pyramid.readTile(0, 0, 3); // no failure lasts
});

test("no retries where none are wanted", async () => {
  server.statuses.push(500);
  await assert.rejects(open({ retries: 0 }), is(HttpError, "500"));
  assert.equal(server.log.length, 1);
});

test("a file on a server without ranges is taken whole, once, if it is small", async () => {
  server.ranges = false;
  const pyramid = await open();
  const { data } = await pyramid.readTile(0, 4, 3);
  const expected = pyramids.expected("blocked", 0);
  assert.equal(data[TILE - 1], expected[expected.length - 1]);
  assert.equal(server.log.length, 1);
});

test("a large file on a server without ranges is an error, whether or not its length is told", async () => {
  server.ranges = false;
  await assert.rejects(open({ maxWholeBytes: 50000 }), is(RangesError, "no ranges"));
  server.contentLength = false;
  await assert.rejects(open({ maxWholeBytes: 50000 }), is(RangesError, "no ranges"));
});

test("a server that does not show the range of its answer is an error", async () => {
  server.contentRange = false;
  await assert.rejects(open(), is(RangesError, "Content-Range"));
});

test("an empty file, and one of another kind, is no pyramid", async () => {
  server.bytes = new Uint8Array(0);
  await assert.rejects(open(), is(FormatError, "no pyramid"));
  server.bytes = new TextEncoder().encode("<html>nothing here</html>");
  await assert.rejects(open(), is(FormatError, "no pyramid"));
});

test("what an incomplete file lacks reads as zeros, and is told", async () => {
  server.bytes = pyramids.bytes("cut");
  const pyramid = await open();
  assert.equal(pyramid.complete, false);
  const expected = pyramids.expected("cut", 0);
  const whole = await pyramid.readWindow<"Byte">(0, { x: 0, y: 0, width: 320, height: 256 });
  assert.deepEqual(whole.data, expected);
  assert.equal(whole.missing, true);
  assert.equal((await pyramid.readTile(0, 0, 0)).missing, false);
  const lost = await pyramid.readTile<"Byte">(0, 4, 3);
  assert.equal(lost.missing, true);
  assert.ok(lost.data.every((value) => value === 0));
  const { statistics, fault } = await pyramid.metadata();
  assert.equal(statistics(0), undefined);
  assert.equal(fault, undefined);
});

test("reads beyond the file, the level or the limits are refused", async () => {
  const pyramid = await open({ maxReadBytes: 2 * TILE });
  await assert.rejects(pyramid.readTile(3, 0, 0), RangeError);
  await assert.rejects(pyramid.readTile(-1, 0, 0), RangeError);
  await assert.rejects(pyramid.readTile(0, 5, 0), RangeError);
  await assert.rejects(pyramid.readTile(0, 0.5, 0), RangeError);
  await assert.rejects(pyramid.readTile(0, NaN, 0), RangeError);
  await assert.rejects(pyramid.readTile(0, 0, 0, { bands: [1] }), RangeError);
  for (const window of [
    { x: 300, y: 0, width: 21, height: 1 },
    { x: -1, y: 0, width: 5, height: 5 },
    { x: 0, y: 0, width: 0, height: 5 },
    { x: 0, y: 250, width: 5, height: Infinity },
  ])
    await assert.rejects(pyramid.readWindow(0, window), RangeError);
  await assert.rejects(pyramid.readWindow(0, { x: 0, y: 0, width: 320, height: 256 }), is(LimitError, "limit"));
  assert.equal(server.log.length, 1);
});

test("a closed pyramid reads nothing more, and what was under way ends", async () => {
  const pyramid = await open();
  server.hold();
  const read = pyramid.readTile(0, 0, 1);
  await server.requests(2);
  await Promise.all([assert.rejects(read, /closed/), pyramid.close()]);
  await assert.rejects(pyramid.readTile(0, 0, 1), /closed/);
  await wait(20);
  assert.equal(server.ended, 1);
});

test("the page of the guide, which is the example, shows the bands of the finest level that fits", async () => {
  const page = readFileSync("examples/page.html", "utf8");
  assert.ok(readFileSync("guide.md", "utf8").includes(page));
  const code = /<script type="module">\s*import .*\n([^]*)<\/script>/.exec(page)?.[1] ?? "";
  const canvas = { getContext: () => ({ putImageData: (picture: Picture) => void (shown = picture) }) };
  interface Picture {
    width: number;
    height: number;
    data: Uint8ClampedArray;
  }
  let shown: Picture | undefined;
  class ImageData implements Picture {
    readonly data: Uint8ClampedArray;
    constructor(
      readonly width: number,
      readonly height: number,
    ) {
      this.data = new Uint8ClampedArray(4 * width * height);
    }
  }
  const AsyncFunction = (async () => undefined).constructor as new (
    ...texts: string[]
  ) => (...rest: unknown[]) => Promise<void>;
  const run = new AsyncFunction("Pyramid", "location", "document", "ImageData", code);
  await run(Pyramid, { href: url }, { getElementById: () => canvas }, ImageData);
  const expected = pyramids.expected("blocked", 0);
  assert.deepEqual([shown?.width, shown?.height], [320, 256]);
  for (const [i, value] of expected.entries())
    assert.deepEqual([...(shown as Picture).data.subarray(4 * i, 4 * i + 4)], [value, value, value, 255]);
});

test("headers and what fetches are the caller's", async () => {
  const asked: unknown[] = [];
  const mine: typeof fetch = (input, init) => {
    asked.push((init?.headers as Record<string, string>).Authorization);
    return fetch(input, init);
  };
  await open({ fetch: mine, headers: { Authorization: "Bearer x" } });
  assert.deepEqual(asked, ["Bearer x"]);
});
