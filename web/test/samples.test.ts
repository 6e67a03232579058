// Every sample of every kind of file, against what GDAL reads in the same bytes.
import assert from "node:assert/strict";
import { after, before, test } from "node:test";

import { type PixelType, Pyramid, type Rectangle, type TileOrdering } from "zmcraster-web";

import { type HeaderValues, headerOf, Pyramids, randomNumbers } from "./support/pyramids.js";

const BYTES: Record<PixelType, number> = {
  Byte: 1,
  Char: 1,
  UInt16: 2,
  Int16: 2,
  UInt32: 4,
  Int32: 4,
  UInt64: 8,
  Int64: 8,
  Single: 4,
  Double: 8,
  ComplexSingle: 8,
  ComplexDouble: 16,
};
const ARRAYS: Record<PixelType, string> = {
  Byte: "Uint8Array",
  Char: "Int8Array",
  UInt16: "Uint16Array",
  Int16: "Int16Array",
  UInt32: "Uint32Array",
  Int32: "Int32Array",
  UInt64: "BigUint64Array",
  Int64: "BigInt64Array",
  Single: "Float32Array",
  Double: "Float64Array",
  ComplexSingle: "Float32Array",
  ComplexDouble: "Float64Array",
};
const TYPES = Object.keys(BYTES) as PixelType[];
const ORDERINGS: TileOrdering[] = ["Scanline", "Blocked", "Morton"];

// Columns, rows, side of a tile, bands, last level. In the last two a power of the level does not divide the side.
const SHAPES: [number, number, number, number, number][] = [
  [130, 100, 32, 3, 2],
  [1, 1, 256, 1, 0],
  [64, 64, 16, 2, 4],
  [257, 65, 64, 1, 3],
  [33, 190, 16, 5, 2],
  [97, 53, 8, 9, 3],
  [50, 41, 7, 2, 2],
  [61, 90, 12, 1, 3],
];

interface Case {
  name: string;
  header: HeaderValues;
}

function caseOf(type: PixelType, ordering: TileOrdering, shape: number, first = 0): Case {
  const [PIXEL_WIDTH, PIXEL_HEIGHT, TILESIZE, BANDS, LEVELMAX] = SHAPES[shape] as [
    number,
    number,
    number,
    number,
    number,
  ];
  const sizes = { PIXEL_WIDTH, PIXEL_HEIGHT, TILESIZE, BANDS, LEVELMAX, LEVELMIN: Math.min(first, LEVELMAX) };
  const header = headerOf({ ...sizes, PIXEL_TYPE: type, BUILD_METHOD: ordering });
  return { name: `${type}-${ordering}-${shape}-${header.LEVELMIN}`, header };
}

const cases: Case[] = [];
for (const [i, type] of TYPES.entries())
  for (const [j, ordering] of ORDERINGS.entries())
    for (const shape of [0, 1 + ((i + j) % (SHAPES.length - 1))]) cases.push(caseOf(type, ordering, shape));
for (const ordering of ORDERINGS)
  for (const shape of SHAPES.keys())
    for (const first of [0, 1]) {
      const each = caseOf("UInt16", ordering, shape, first);
      if (!cases.some(({ name }) => name === each.name)) cases.push(each);
    }

const pyramids = new Pyramids();
before(() => void pyramids.make(cases.map((each, seed) => ({ ...each, seed }))));
after(() => pyramids.remove());

// What a slice of the samples of a level is, sample by sample.
function slice(all: Uint8Array, { header }: Case, level: number, at: Rectangle, bands: number[], perPixel: boolean) {
  const [columns, rows] = [header.PIXEL_WIDTH >> level, header.PIXEL_HEIGHT >> level];
  const size = BYTES[header.PIXEL_TYPE];
  const out = new Uint8Array(at.width * at.height * bands.length * size);
  for (let i = 0; i < bands.length; ++i)
    for (let y = 0; y < at.height; ++y)
      for (let x = 0; x < at.width; ++x) {
        const from = ((bands[i] as number) * rows + at.y + y) * columns + at.x + x;
        const to = perPixel ? (y * at.width + x) * bands.length + i : (i * at.height + y) * at.width + x;
        out.set(all.subarray(from * size, (from + 1) * size), to * size);
      }
  return out;
}

const bytesOf = (data: ArrayBufferView): Uint8Array => new Uint8Array(data.buffer, data.byteOffset, data.byteLength);
const allBands = ({ header }: Case): number[] => Array.from({ length: header.BANDS }, (_, band) => band);

for (const each of cases)
  test(`${each.name}: levels, tiles and windows are those that GDAL reads`, async () => {
    const pyramid = await Pyramid.open(pyramids.bytes(each.name));
    const next = randomNumbers(cases.indexOf(each));
    assert.equal(pyramid.complete, true);
    for (const level of pyramid.levels) {
      const expected = pyramids.expected(each.name, level.level);
      const whole = { x: 0, y: 0, width: level.width, height: level.height };
      const answer = await pyramid.readWindow(level.level, whole, { interleave: "band" });
      assert.equal(answer.data.constructor.name, ARRAYS[each.header.PIXEL_TYPE]);
      assert.equal(answer.missing, false);
      assert.deepEqual(bytesOf(answer.data), expected, `level ${level.level}`);

      for (let i = 0; i < 6; ++i) {
        const [column, row] = [next() % level.tilesAcross, next() % level.tilesDown];
        const tile = await pyramid.readTile(level.level, column, row);
        assert.deepEqual([tile.x, tile.y], [column * each.header.TILESIZE, row * each.header.TILESIZE]);
        assert.deepEqual(bytesOf(tile.data), slice(expected, each, level.level, tile, allBands(each), true));

        const [x, y] = [next() % level.width, next() % level.height];
        const window = { x, y, width: 1 + (next() % (level.width - x)), height: 1 + (next() % (level.height - y)) };
        const bands = Array.from({ length: 1 + (next() % 4) }, () => next() % each.header.BANDS);
        const interleave = next() % 2 ? "pixel" : "band";
        const part = await pyramid.readWindow(level.level, window, { bands, interleave });
        const model = slice(expected, each, level.level, window, bands, interleave === "pixel");
        assert.deepEqual(bytesOf(part.data), model, JSON.stringify({ level: level.level, window, bands, interleave }));
        assert.deepEqual(part.bands, bands);
      }
    }
  });
