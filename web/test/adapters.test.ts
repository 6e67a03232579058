// Pyramids in viewers. OpenLayers itself loads the tiles here. OpenSeadragon needs a document, which Node does not
// have: of its adapter the pictures are tried, and the rest is held by the types of its package.
import assert from "node:assert/strict";
import { after, before, test } from "node:test";

import type DataTile from "ol/DataTile.js";
import { Projection } from "ol/proj.js";
import type DataTileSource from "ol/source/DataTile.js";
import TileState from "ol/TileState.js";
import { Pyramid } from "zmcraster-web";
import { createSource } from "zmcraster-web/openlayers";
import { createTileSource, lookOf, toRgba } from "zmcraster-web/openseadragon";

import { headerOf, Pyramids } from "./support/pyramids.js";

const pyramids = new Pyramids();
const sizes = { PIXEL_WIDTH: 201, PIXEL_HEIGHT: 150, LEVELMAX: 2, BANDS: 3 };
before(() => {
  pyramids.make([
    { name: "bytes", seed: 1, header: headerOf(sizes) },
    { name: "shorts", seed: 2, header: headerOf({ ...sizes, PIXEL_TYPE: "Int16" }) },
    { name: "complex", seed: 3, header: headerOf({ ...sizes, PIXEL_TYPE: "ComplexDouble" }) },
    { name: "colored", seed: 4, array: [1, 10, 10], colors: Array.from({ length: 250 }, (_, i) => [i, 1, 2, 255]) },
  ]);
});
after(() => pyramids.remove());

const projection = new Projection({ code: "pixels", units: "pixels" });

async function load(source: DataTileSource, z: number, x: number, y: number): Promise<Uint8Array | Float32Array> {
  const tile = source.getTile(z, x, y, 1, projection) as unknown as DataTile;
  tile.load();
  while (tile.getState() === TileState.LOADING) await new Promise((resolve) => setTimeout(resolve, 2));
  assert.equal(tile.getState(), TileState.LOADED);
  return tile.getData() as Uint8Array | Float32Array;
}

test("OpenLayers gets the grid of the levels, from the coarsest on", async () => {
  const pyramid = await Pyramid.open(pyramids.bytes("bytes"));
  const source = createSource(pyramid, { origin: [1000, 2000], pixelSize: 30, projection });
  const grid = source.getTileGrid();
  assert.deepEqual(grid?.getResolutions(), [120, 60, 30]);
  assert.deepEqual(grid?.getExtent(), [1000, 2000 - 150 * 30, 1000 + 201 * 30, 2000]);
  assert.equal(source.bandCount, 4);
});

test("OpenLayers gets whole tiles of samples and where they are", async () => {
  const pyramid = await Pyramid.open(pyramids.bytes("bytes"));
  const data = await load(createSource(pyramid, { projection }), 2, 3, 2);
  assert.ok(data instanceof Uint8Array);
  assert.equal(data.length, 64 * 64 * 4);
  const { data: samples, width, height } = await pyramid.readTile(0, 3, 2);
  assert.deepEqual([width, height], [9, 22]);
  for (let y = 0; y < 64; ++y)
    for (let x = 0; x < 64; ++x) {
      const inside = x < width && y < height;
      const from = (y * width + x) * 3;
      const expected = inside ? [...samples.subarray(from, from + 3), 255] : [0, 0, 0, 0];
      const to = (y * 64 + x) * 4;
      assert.deepEqual([...data.subarray(to, to + 4)], expected);
    }
});

test("OpenLayers gets other types as reals, and no data as nothing", async () => {
  const pyramid = await Pyramid.open(pyramids.bytes("shorts"));
  const { data: samples } = await pyramid.readTile<"Int16">(1, 0, 0, { bands: [2] });
  const noData = samples[5] as number;
  const data = await load(createSource(pyramid, { projection, bands: [2], noData }), 1, 0, 0);
  assert.ok(data instanceof Float32Array);
  for (let i = 0; i < samples.length; ++i) {
    assert.equal(data[2 * i], samples[i]);
    assert.equal(data[2 * i + 1], samples[i] === noData ? 0 : 1);
  }
});

test("OpenLayers gets the magnitude of complex samples", async () => {
  const pyramid = await Pyramid.open(pyramids.bytes("complex"));
  const { data: samples } = await pyramid.readTile<"ComplexDouble">(2, 0, 0, { bands: [0] });
  const data = await load(createSource(pyramid, { projection, bands: [0] }), 0, 0, 0);
  const width = 50;
  assert.equal(data[2], Math.fround(Math.hypot(samples[2] as number, samples[3] as number)));
  assert.equal(data[64 * 2], Math.fround(Math.hypot(samples[2 * width] as number, samples[2 * width + 1] as number)));
});

test("OpenLayers gets no source of bands that there are not", async () => {
  const pyramid = await Pyramid.open(pyramids.bytes("bytes"));
  assert.throws(() => createSource(pyramid, { bands: [3] }), RangeError);
  assert.throws(() => createSource(pyramid, { bands: [] }), RangeError);
});

test("a picture is stretched over its range, and transparent without data", async () => {
  const pyramid = await Pyramid.open(pyramids.bytes("shorts"));
  const pixels = await pyramid.readTile<"Int16">(0, 0, 0, { bands: [1] });
  const noData = pixels.data[0] as number;
  const look = { bands: [1], ranges: [[-100, 100]], palette: undefined, noData } as const;
  const out = toRgba(pixels, look);
  for (const i of pixels.data.keys()) {
    const value = pixels.data[i] as number;
    const grey = Uint8ClampedArray.of(((value + 100) / 200) * 255)[0];
    const expected = value === noData ? [0, 0, 0, 0] : [grey, grey, grey, 255];
    assert.deepEqual([...out.subarray(i * 4, i * 4 + 4)], expected);
  }
});

test("a picture of a palette has its colors", async () => {
  const pyramid = await Pyramid.open(pyramids.bytes("colored"));
  const palette = (await pyramid.metadata()).palette(0);
  const pixels = await pyramid.readTile<"Byte">(0, 0, 0);
  const out = toRgba(pixels, { bands: [0], ranges: [[0, 255]], palette, noData: undefined });
  for (const [i, value] of pixels.data.entries())
    assert.deepEqual([...out.subarray(i * 4, i * 4 + 4)], [value, 1, 2, 255]);
});

test("a palette is for integers, and not for reals beside which the file has colours", async () => {
  const known = await Pyramid.open(pyramids.bytes("colored"));
  const metadata = await known.metadata();
  const of = async (pixelType: string): Promise<Uint8Array | undefined> => {
    const records = {
      statistics: () => ({ minimum: 0, maximum: 1 }),
      palette: (band: number) => metadata.palette(band),
    };
    const pyramid = { header: { bands: 1, pixelType }, metadata: () => Promise.resolve(records) };
    return (await lookOf(pyramid as never, {})).palette;
  };
  for (const type of ["Byte", "Char", "Int16", "UInt64"]) assert.deepEqual(await of(type), metadata.palette(0));
  for (const type of ["Single", "Double", "ComplexSingle", "ComplexDouble"]) assert.equal(await of(type), undefined);
});

test("OpenSeadragon gets no source of what cannot be shown", async () => {
  const none = undefined as never;
  const shorts = await Pyramid.open(pyramids.bytes("shorts"));
  await assert.rejects(createTileSource(none, shorts), /one has to be given/);
  await assert.rejects(createTileSource(none, shorts, { bands: [0, 1] }), RangeError);
  await assert.rejects(createTileSource(none, shorts, { bands: [7] }), RangeError);
});
