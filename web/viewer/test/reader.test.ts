// The reader in a real browser, against the same reader in Node, whose samples other tests hold against GDAL's.
import assert from "node:assert/strict";
import { createHash } from "node:crypto";
import { readFileSync } from "node:fs";
import { after, before, test } from "node:test";

import type { Page } from "playwright-core";
import { Pyramid } from "zmcraster-web";

import { headerOf, PIXEL_TYPES, Pyramids } from "../../test/support/pyramids.js";
import { Bench } from "./support/browser.js";

const ORDERINGS = ["Scanline", "Blocked", "Morton"] as const;

const bench = new Bench();
const pyramids = new Pyramids();
let page: Page;

before(async () => {
  await bench.start();
  const shape = { PIXEL_WIDTH: 97, PIXEL_HEIGHT: 61, TILESIZE: 16, LEVELMAX: 3, BANDS: 3 };
  const jobs = PIXEL_TYPES.flatMap((type, seed) =>
    ORDERINGS.map((ordering) => ({
      name: `${type}-${ordering}`,
      seed,
      header: headerOf({ ...shape, PIXEL_TYPE: type, BUILD_METHOD: ordering }),
    })),
  );
  pyramids.make(jobs);
  for (const { name } of jobs) bench.put(`${name}.pyr`, pyramids.bytes(name));
  const module = Uint8Array.from(readFileSync("dist/index.js"));
  bench.site.files.set("reader.js", { bytes: module, type: "text/javascript", shared: true });
  bench.site.files.set("empty.html", { bytes: new TextEncoder().encode("<!doctype html>"), type: "text/html" });
  page = await bench.open();
  await page.goto(`${bench.base}/empty.html`);
});
after(async () => {
  await bench.stop();
  pyramids.remove();
});

interface Told {
  levels: number[];
  arrays: string[];
  hashes: string[];
}

async function inBrowser(name: string): Promise<Told> {
  return page.evaluate(async (name) => {
    const { Pyramid } = (await import(`${location.origin}/reader.js`)) as {
      Pyramid: typeof import("zmcraster-web").Pyramid;
    };
    const pyramid = await Pyramid.open(new URL(`${name}.pyr`, location.href));
    const told = { levels: [] as number[], arrays: [] as string[], hashes: [] as string[] };
    for (const { level, width, height } of pyramid.levels)
      for (const interleave of ["pixel", "band"] as const) {
        const { data } = await pyramid.readWindow(level, { x: 0, y: 0, width, height }, { interleave });
        const hash = new Uint8Array(await crypto.subtle.digest("SHA-256", data as Uint8Array<ArrayBuffer>));
        told.levels.push(level);
        told.arrays.push(data.constructor.name);
        told.hashes.push([...hash].map((byte) => byte.toString(16).padStart(2, "0")).join(""));
      }
    return told;
  }, name);
}

async function inNode(name: string): Promise<Told> {
  const pyramid = await Pyramid.open(pyramids.bytes(name));
  const told: Told = { levels: [], arrays: [], hashes: [] };
  for (const { level, width, height } of pyramid.levels)
    for (const interleave of ["pixel", "band"] as const) {
      const { data } = await pyramid.readWindow(level, { x: 0, y: 0, width, height }, { interleave });
      const bytes = new Uint8Array(data.buffer, data.byteOffset, data.byteLength);
      told.levels.push(level);
      told.arrays.push(data.constructor.name);
      told.hashes.push(createHash("sha256").update(bytes).digest("hex"));
    }
  return told;
}

for (const type of PIXEL_TYPES)
  test(`${type}: in all orderings a browser reads the samples that Node reads`, async () => {
    for (const ordering of ORDERINGS) {
      const name = `${type}-${ordering}`;
      const told = await inBrowser(name);
      assert.equal(told.hashes.length, 8);
      assert.deepEqual(told, await inNode(name), name);
    }
  });

test("the page of the documents, as it stands, shows a pyramid sample by sample", async () => {
  pyramids.make([{ name: "scene", seed: 9, array: [3, 90, 120] }]);
  bench.putExample(pyramids.bytes("scene"));
  const shown = await bench.visit(`${bench.base}/page.html`);
  await shown.waitForFunction(() => document.querySelector("canvas")?.width === 120);
  const pixels = await shown.evaluate(() => {
    const canvas = document.querySelector("canvas") as HTMLCanvasElement;
    return [...(canvas.getContext("2d") as CanvasRenderingContext2D).getImageData(0, 0, 120, canvas.height).data];
  });
  const bands = pyramids.expected("scene", 0);
  assert.equal(pixels.length, 4 * 120 * 90);
  for (let i = 0; i < 120 * 90; ++i)
    assert.deepEqual(
      pixels.slice(4 * i, 4 * i + 4),
      [0, 1, 2].map((band) => bands[band * 120 * 90 + i]).concat(255),
      `pixel ${i}`,
    );
  await shown.context().close();
});
