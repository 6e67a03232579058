// Where bytes may come from, and what goes wrong there.
import assert from "node:assert/strict";
import { appendFileSync, copyFileSync, renameSync, writeFileSync } from "node:fs";
import { after, before, test } from "node:test";

import { ChangedError, FormatError, Pyramid, type Source, SourceError } from "zmcraster-web";
import { FileSource, openFile } from "zmcraster-web/node";

import { headerOf, Pyramids } from "./support/pyramids.js";

const pyramids = new Pyramids();
const header = headerOf({ PIXEL_WIDTH: 200, PIXEL_HEIGHT: 150, BANDS: 2, LEVELMAX: 1 });
before(() => {
  pyramids.make([
    { name: "scene", seed: 1, header },
    { name: "other", seed: 2, header },
    { name: "cut", seed: 3, cut: 30000, header },
  ]);
});
after(() => pyramids.remove());

const whole = { x: 0, y: 0, width: 200, height: 150 };
async function check(pyramid: Pyramid, name = "scene"): Promise<void> {
  const { data } = await pyramid.readWindow<"Byte">(0, whole, { interleave: "band" });
  assert.deepEqual(data, pyramids.expected(name, 0));
}

test("a Blob, an ArrayBuffer, a view into a larger one and a Buffer are read", async () => {
  const bytes = pyramids.bytes("scene");
  await check(await Pyramid.open(new Blob([bytes])));
  await check(await Pyramid.open(bytes.slice().buffer));
  const larger = new Uint8Array(bytes.length + 7);
  larger.set(bytes, 3);
  await check(await Pyramid.open(larger.subarray(3, 3 + bytes.length)));
  await check(await Pyramid.open(Buffer.from(bytes)));
});

test("a Blob that can be read no more has changed", async () => {
  const blob = new Blob([pyramids.bytes("scene")]);
  const pyramid = await Pyramid.open(blob);
  blob.slice = () => ({ arrayBuffer: () => Promise.reject(new Error("NotReadableError")) }) as unknown as Blob;
  await assert.rejects(pyramid.readTile(0, 2, 2), ChangedError);
});

test("any object that reads is a source, with or without a size, and at odd places in memory", async () => {
  const bytes = pyramids.bytes("scene");
  const odd = async (offset: number, length: number): Promise<Uint8Array> => {
    const part = bytes.subarray(offset, offset + length);
    const larger = new Uint8Array(part.length + 1);
    larger.set(part, 1);
    return larger.subarray(1);
  };
  const sized = await Pyramid.open({ size: bytes.length, read: odd });
  await check(sized);
  assert.equal(sized.complete, true);
  const unsized = await Pyramid.open({ read: odd });
  assert.equal(unsized.fileSize, undefined);
  await check(unsized);
});

test("a source of unknown size ends where it answers with less", async () => {
  const bytes = pyramids.bytes("cut");
  const pyramid = await Pyramid.open({ read: async (offset, length) => bytes.slice(offset, offset + length) });
  await check(pyramid, "cut");
});

test("a source that answers with less or more than its size allows is an error", async () => {
  const bytes = pyramids.bytes("scene");
  for (const change of [-1, 1]) {
    const read = async (offset: number, length: number): Promise<Uint8Array> =>
      bytes.slice(offset, offset + length + (offset ? change : 0));
    const pyramid = await Pyramid.open({ size: bytes.length, read });
    await assert.rejects(pyramid.readTile(0, 1, 1), SourceError);
  }
  await assert.rejects(Pyramid.open({ size: 10 ** 6, read: async () => bytes.slice(0, 100) }), FormatError);
});

test("what a source fails with reaches all who wait, and the next read asks anew", async () => {
  const bytes = pyramids.bytes("scene");
  let fail = false;
  const source: Source = {
    size: bytes.length,
    read: async (offset, length) => {
      if (fail) throw new Error("mine");
      return bytes.slice(offset, offset + length);
    },
  };
  const pyramid = await Pyramid.open(source);
  fail = true;
  const reads = [pyramid.readTile(0, 1, 1), pyramid.readTile(0, 1, 1)];
  for (const read of reads) await assert.rejects(read, /^Error: mine$/);
  fail = false;
  await check(pyramid);
});

test("a file is read by its name in Node", async () => {
  const pyramid = await openFile(pyramids.path("scene"));
  await check(pyramid);
  await pyramid.close();
  await assert.rejects(pyramid.readTile(0, 0, 0), /closed/);
});

test("a file keeps to what was opened when its name goes to another", async () => {
  copyFileSync(pyramids.path("scene"), pyramids.path("moved"));
  const pyramid = await openFile(pyramids.path("moved"));
  copyFileSync(pyramids.path("other"), pyramids.path("next"));
  renameSync(pyramids.path("next"), pyramids.path("moved"));
  await check(pyramid);
  await pyramid.close();
});

test("a file that is written to has changed", async () => {
  copyFileSync(pyramids.path("scene"), pyramids.path("written"));
  const pyramid = await openFile(pyramids.path("written"));
  appendFileSync(pyramids.path("written"), "more");
  await assert.rejects(pyramid.readTile(0, 1, 1), ChangedError);
  await pyramid.close();
});

test("a file that is none is an error of one line, and is not left open", async () => {
  await assert.rejects(openFile(pyramids.path("nowhere")), (error: Error) => {
    assert.ok(error instanceof SourceError && !error.message.includes("\n"));
    return error.message.includes("nowhere");
  });
  await assert.rejects(openFile(pyramids.folder), SourceError);
  writeFileSync(pyramids.path("text"), "nothing");
  await assert.rejects(openFile(pyramids.path("text")), FormatError);
});

test("reads of a file can be aborted", async () => {
  const source = await FileSource.open(pyramids.path("scene"));
  await assert.rejects(source.read(0, 100, AbortSignal.abort()), { name: "AbortError" });
  await source.close();
});

test("errors tell their names, whatever bundling makes of their classes", async () => {
  await assert.rejects(Pyramid.open(new Uint8Array(5)), { name: "FormatError" });
  assert.equal(new SourceError("x").name, "SourceError");
  assert.equal(new ChangedError("x").name, "ChangedError");
});
