// Pictures of a real browser, against what the samples make of the formulas.
import assert from "node:assert/strict";
import { spawnSync } from "node:child_process";
import { existsSync, readFileSync, writeFileSync } from "node:fs";
import { after, before, test } from "node:test";

import type { Page } from "playwright-core";
import { type PixelType, Pyramid } from "zmcraster-web";

import { documentOf, fileOf, headerOf, Pyramids } from "../../test/support/pyramids.js";
import type { App } from "../src/app.js";
import type { Renderer } from "../src/renderer.js";
import { assertSame, Bench, go, picture } from "./support/browser.js";
import { draw, type ModelStyle, type Picture } from "./support/model.js";

declare const viewer: App;

const bench = new Bench();
const pyramids = new Pyramids();
let page: Page;

// A stretch for samples of random bits, of which a good part lies inside.
const STRETCHES: Record<PixelType, [number, number]> = {
  Byte: [20, 230],
  Char: [-100, 90],
  UInt16: [1000.5, 60000.25],
  Int16: [-30000, 20000],
  UInt32: [1e9, 4e9],
  Int32: [-2e9, 2e9],
  UInt64: [2 ** 62, 2 ** 64],
  Int64: [-(2 ** 62), 2 ** 62],
  Single: [-10, 1000],
  Double: [-1e30, 1e20],
  ComplexSingle: [0, 1e6],
  ComplexDouble: [0, 1e30],
};
const TYPES = Object.keys(STRETCHES) as PixelType[];
const ORDERINGS = ["Scanline", "Blocked", "Morton"] as const;
const SIZE = { PIXEL_WIDTH: 130, PIXEL_HEIGHT: 100, TILESIZE: 32, LEVELMAX: 2, BANDS: 5 };

/** A file of one level with samples that are told, pixel by pixel. */
function fileWith(
  type: PixelType,
  width: number,
  height: number,
  bands: number,
  data: ArrayBufferView,
  behind = "",
): Uint8Array {
  const header = headerOf({ PIXEL_TYPE: type, PIXEL_WIDTH: width, PIXEL_HEIGHT: height, BANDS: bands, TILESIZE: 256 });
  const samples = Buffer.from(data.buffer, data.byteOffset, data.byteLength);
  return fileOf(documentOf(header), Buffer.concat([samples, Buffer.from(behind)]));
}

before(async () => {
  await bench.start();
  const jobs = TYPES.map((type, i) => ({
    name: type,
    seed: i,
    header: headerOf({ ...SIZE, PIXEL_TYPE: type, BUILD_METHOD: ORDERINGS[i % 3] as "Blocked" }),
  }));
  pyramids.make(jobs);
  pyramids.make([{ name: "archived", seed: 99, array: [3, 90, 120] }]);
  pyramids.make([{ name: "single", seed: 98, array: [1, 90, 120] }]);
  for (const name of ["archived", "single"]) bench.put(`${name}.pyr`, pyramids.bytes(name));
  for (const type of TYPES) bench.put(`${type}.pyr`, pyramids.bytes(type));
  page = await bench.open("", { viewport: { width: 340, height: 300 } });
});
after(async () => {
  await bench.stop();
  pyramids.remove();
});

const stretchOf = (ranges: readonly (readonly number[])[]): string => ranges.map((range) => range.join(",")).join(";");

/** Shows a file by a link, and compares the picture with the model's. */
async function compare(name: string, more: string, style: ModelStyle, zoom = 1, level = 0): Promise<Picture> {
  const pyramid = await Pyramid.open((bench.site.files.get(name) as { bytes: Uint8Array }).bytes);
  const [x, y] = [Math.floor(pyramid.header.width / 2), Math.floor(pyramid.header.height / 2)];
  const bands = style.bands.map((band) => band + 1).join(",");
  await go(page, `file=${name}&at=${x},${y}&zoom=${zoom}&bands=${bands}&stretch=${stretchOf(style.ranges)}${more}`);
  const actual = await picture(page);
  const { width, height } = actual;
  assertSame(actual, await draw(pyramid, { width, height }, { x, y, zoom, level }, style), `${name} ${more} ${zoom}`);
  return actual;
}

for (const type of TYPES)
  test(`${type}: at 1:1 and coarser scales every pixel is the sample that the formulas make of it`, async () => {
    const range = STRETCHES[type];
    await compare(`${type}.pyr`, "", { bands: [1], ranges: [range] });
    await compare(`${type}.pyr`, "&gamma=2.2", { bands: [3], ranges: [range], gamma: 2.2 }, 0.5, 1);
    const [low, high] = range;
    const ranges: [number, number][] = [range, [low, (low + high) / 2], [high, low]];
    await compare(`${type}.pyr`, "", { bands: [4, 0, 2], ranges }, 0.25, 2);
    await compare(`${type}.pyr`, "", { bands: [0, 1, 2], ranges }, 4);
  });

test("every part of complex samples is shown", async () => {
  for (const part of ["real", "imaginary"] as const)
    for (const type of ["ComplexSingle", "ComplexDouble"])
      await compare(`${type}.pyr`, `&complex=${part}`, { bands: [2], ranges: [[-1000, 5]], part });
  // Without numbers below 1e-38, which graphics processors take for 0.
  const parts = [0, -0, 1, -1, 0.3, -1e30, 1e-30, -2.5, 7e37, -1e-36];
  const samples = Float32Array.from({ length: 2 * 3600 }, (_, i) => parts[(i * 3 + Math.floor(i / 20)) % 10] as number);
  bench.put("phase.pyr", fileWith("ComplexSingle", 60, 60, 1, samples));
  await compare("phase.pyr", "&complex=phase", { bands: [0], ranges: [[-3.5, 3.5]], part: "phase" });
  await compare("phase.pyr", "", { bands: [0], ranges: [[0, 3]] });
});

const maps = new Map(
  readFileSync(existsSync("colormaps.txt") ? "colormaps.txt" : "../render/colormaps.txt", "utf8")
    .split("\n")
    .filter((line) => /^[a-z]/.test(line))
    .map((line) => line.split(" ") as [string, string])
    .map(([name, hex]) => [name, Array.from({ length: 256 }, (_, i) => colorAt(hex, i))]),
);

function colorAt(hex: string, i: number): number[] {
  return [0, 2, 4].map((at) => parseInt(hex.slice(6 * i + at, 6 * i + at + 2), 16));
}

test("every colour map gives its entry, and reversed the one from the other end", async () => {
  assert.ok(maps.size >= 8);
  for (const [name, colors] of maps)
    await compare("Int16.pyr", name === "grey" ? "" : `&colormap=${name}`, {
      bands: [0],
      ranges: [STRETCHES.Int16],
      colors,
    });
  const colors = [...(maps.get("viridis") as number[][])].reverse();
  await compare("Int16.pyr", "&colormap=-viridis", { bands: [0], ranges: [STRETCHES.Int16], colors });
});

test("the palette of a file is shown at once, and indices without a colour are transparent", async () => {
  const samples = Uint8Array.from({ length: 6400 }, (_, i) => i % 7);
  const colors = [
    [255, 0, 0, 255],
    [0, 255, 0, 255],
    [0, 0, 255, 128],
    [9, 8, 7, 0],
    [1, 2, 3, 255],
  ];
  const rows = colors.map((color) => `<PALETTE_RGBA>${color.join("|")}</PALETTE_RGBA>`).join("");
  const records = `<DATASET><PALETTE><PALETTE_BAND>0</PALETTE_BAND>${rows}</PALETTE></DATASET>`;
  bench.put("palette.pyr", fileWith("Byte", 80, 80, 1, samples, records));
  const style: ModelStyle = { bands: [0], ranges: [[0, 255]], colors, palette: true };
  await compare("palette.pyr", "&colormap=palette", style);
  await go(page, "file=palette.pyr&at=40,40&zoom=1");
  assert.equal(await page.getByLabel("Colours").inputValue(), "palette");
});

test("a palette beside reals is shown only where it is asked for", async () => {
  const samples = Float32Array.from({ length: 6400 }, (_, i) => (i % 7) / 2);
  const records =
    "<DATASET><PALETTE><PALETTE_BAND>0</PALETTE_BAND><PALETTE_RGBA>1|2|3|255</PALETTE_RGBA></PALETTE></DATASET>";
  bench.put("heights.pyr", fileWith("Single", 80, 80, 1, samples, records));
  await go(page, "file=heights.pyr&at=40,40&zoom=1");
  assert.equal(await page.getByLabel("Colours").inputValue(), "grey");
  const pyramid = await Pyramid.open((bench.site.files.get("heights.pyr") as { bytes: Uint8Array }).bytes);
  const shown = await picture(page);
  const view = { x: 40, y: 40, zoom: 1, level: 0 };
  assertSame(shown, await draw(pyramid, shown, view, { bands: [0], ranges: [[0, 3]] }), "stretched");
  const style = { bands: [0], ranges: [[0, 3]] as [number, number][], colors: [[1, 2, 3, 255]], palette: true };
  await compare("heights.pyr", "&colormap=palette", style);
});

const EDGES = [0, -0, 1, -1, 7, 7.5, 1e-30, 3e38, -3e38, NaN, Infinity, -Infinity];

test("samples that are no numbers or infinite are transparent, and in some bands of a pixel black", async () => {
  const samples = Float32Array.from({ length: 3 * 4096 }, (_, i) => EDGES[(i * 7 + Math.floor(i / 36)) % 12] as number);
  bench.put("edges.pyr", fileWith("Single", 64, 64, 3, samples));
  bench.put("wide.pyr", fileWith("Double", 64, 64, 3, Float64Array.from(samples)));
  for (const name of ["edges.pyr", "wide.pyr"]) {
    await compare(name, "", { bands: [0], ranges: [[-2, 8]] });
    await compare(name, "", {
      bands: [0, 1, 2],
      ranges: [
        [-2, 8],
        [0, 7],
        [1, 1],
      ],
    });
    await compare(name, "&nodata=7", {
      bands: [0, 1, 2],
      ranges: [
        [-2, 8],
        [0, 7],
        [1, 1],
      ],
      noData: 7,
    });
    await compare(name, "&nodata=7.5", { bands: [1], ranges: [[0, 8]], noData: 7.5 });
  }
});

test("a value without data is transparent in every type that can have it", async () => {
  await compare("Byte.pyr", "&nodata=77", { bands: [0], ranges: [[0, 255]], noData: 77 });
  await compare("Char.pyr", "&nodata=-5", { bands: [0], ranges: [[-128, 127]], noData: -5 });
  const real = Float32Array.from({ length: 4096 }, (_, i) => (i % 5) / 10);
  bench.put("tenths.pyr", fileWith("Single", 64, 64, 1, real));
  await compare("tenths.pyr", "&nodata=0.1", { bands: [0], ranges: [[0, 0.5]], noData: Math.fround(0.1) });
  const complex = Float64Array.from({ length: 8192 }, (_, i) => (i % 2 ? i % 3 : 3 + (i % 7)));
  bench.put("pairs.pyr", fileWith("ComplexDouble", 64, 64, 1, complex));
  bench.put("pairs-32.pyr", fileWith("ComplexSingle", 64, 64, 1, Float32Array.from(complex)));
  await compare("pairs.pyr", "&nodata=5", { bands: [0], ranges: [[0, 12]], noData: 5 });
  await compare("pairs-32.pyr", "&nodata=5", { bands: [0], ranges: [[0, 12]], noData: 5 });
  await compare("Byte.pyr", "&nodata=77.5", { bands: [0], ranges: [[0, 255]] });
  const samples = BigInt64Array.from({ length: 4096 }, (_, i) => 2n ** 62n + BigInt(i % 50));
  bench.put("exact.pyr", fileWith("Int64", 64, 64, 1, samples));
  const range: [number, number] = [2 ** 62, 2 ** 62 + 1024];
  // Of 64 bits, not the neighbours that a real would take for the same.
  await compare("exact.pyr", `&nodata=${2n ** 62n + 7n}`, { bands: [0], ranges: [range], noData: 2n ** 62n + 7n });
});

test("narrow stretches of large values keep their steps", async () => {
  const spread = (i: number): number => (i * 37) % 1024;
  const wide = BigInt64Array.from({ length: 4096 }, (_, i) => 2n ** 62n + BigInt(spread(i)));
  const unsigned = BigUint64Array.from({ length: 4096 }, (_, i) => 2n ** 63n + BigInt(4 * spread(i)));
  const whole = Uint32Array.from({ length: 4096 }, (_, i) => 4e9 + spread(i));
  const real = Float32Array.from({ length: 4096 }, (_, i) => 2 ** 22 + spread(i) / 4);
  const double = Float64Array.from({ length: 4096 }, (_, i) => 1e12 + spread(i) / 1024);
  bench.put("narrow-64.pyr", fileWith("Int64", 64, 64, 1, wide));
  bench.put("narrow-u64.pyr", fileWith("UInt64", 64, 64, 1, unsigned));
  bench.put("narrow-32.pyr", fileWith("UInt32", 64, 64, 1, whole));
  bench.put("narrow-real.pyr", fileWith("Single", 64, 64, 1, real));
  bench.put("narrow-double.pyr", fileWith("Double", 64, 64, 1, double));
  await compare("narrow-64.pyr", "", { bands: [0], ranges: [[2 ** 62, 2 ** 62 + 1024]] });
  await compare("narrow-u64.pyr", "", { bands: [0], ranges: [[2 ** 63, 2 ** 63 + 4096]] });
  await compare("narrow-32.pyr", "", { bands: [0], ranges: [[4e9 + 0.5, 4e9 + 1000.25]] });
  await compare("narrow-real.pyr", "", { bands: [0], ranges: [[2 ** 22 + 0.1, 2 ** 22 + 256.1]] });
  await compare("narrow-double.pyr", "", { bands: [0], ranges: [[1e12, 1e12 + 1]] });
  // From a wide stretch to a narrow one the samples are converted anew.
  await compare("narrow-double.pyr", "", { bands: [0], ranges: [[0, 2e12]] });
  await compare("narrow-double.pyr", "", { bands: [0], ranges: [[1e12 + 0.25, 1e12 + 0.75]] });
});

test("a minimum that is the maximum splits the samples, and one above it turns them round", async () => {
  await compare("Byte.pyr", "", { bands: [0], ranges: [[100, 100]] });
  await compare("Byte.pyr", "", { bands: [0], ranges: [[99.5, 99.5]] });
  await compare("Byte.pyr", "", { bands: [0], ranges: [[200, 50]] });
  await compare("Single.pyr", "", { bands: [0], ranges: [[0.5, 0.5]] });
});

test("a band of opacity makes pixels transparent", async () => {
  await compare("Byte.pyr", "&alpha=4", {
    bands: [0, 1, 2],
    ranges: [
      [0, 255],
      [0, 255],
      [9, 99],
    ],
    alpha: 3,
  });
  await compare("Byte.pyr", "&alpha=5", { bands: [0], ranges: [[0, 255]], alpha: 4 });
});

test("two sides meet where the slider is, and a raster of half the size fills the same area", async () => {
  const samples = Uint8Array.from({ length: 65 * 50 }, (_, i) => i % 251);
  bench.put("half.pyr", fileWith("Byte", 65, 50, 1, samples));
  const link = "at=65,50&zoom=2&bands=1&stretch=0,255";
  await go(page, `file=Byte.pyr&${link}`);
  const left = await picture(page);
  await go(page, `file=Byte.pyr&${link}&b.file=half.pyr&b.bands=1&b.stretch=0,255&swipe=0.5`);
  const both = await picture(page);
  const pyramid = await Pyramid.open((bench.site.files.get("half.pyr") as { bytes: Uint8Array }).bytes);
  const { width, height } = both;
  const style = { bands: [0], ranges: [[0, 255]] as [number, number][] };
  const right = await draw(pyramid, { width, height }, { x: 32.5, y: 25, zoom: 4, level: 0 }, style);
  const expected = Uint8Array.from(
    both.pixels,
    (_, i) => ((i >> 2) % width < Math.round(width / 2) ? left : right).pixels[i] as number,
  );
  assertSame(both, { width, height, pixels: expected }, "two sides");
});

test("two rasters in one coordinate system lie over each other by their coordinates", async () => {
  const samples = Uint8Array.from({ length: 40 * 30 }, (_, i) => (i * 7) % 253);
  const place = (transform: string): Uint8Array =>
    new TextEncoder().encode(
      `<PAMDataset><SRS>LOCAL_CS["site"]</SRS><GeoTransform>${transform}</GeoTransform></PAMDataset>`,
    );
  bench.put("left.pyr", fileWith("Byte", 100, 80, 1, new Uint8Array(8000).fill(9)));
  bench.put("left.pyr.aux.xml", place("1000,1,0,2000,0,-1"));
  bench.put("right.pyr", fileWith("Byte", 40, 30, 1, samples));
  bench.put("right.pyr.aux.xml", place("1010,2,0,1990,0,-2"));
  // What tells of the coordinates comes last.
  bench.site.judge = (path) => (path === "right.pyr.aux.xml" ? "wait" : undefined);
  setTimeout(() => bench.site.release(), 300);
  await go(
    page,
    "file=left.pyr&at=50,40&zoom=2&bands=1&stretch=0,255&b.file=right.pyr&b.bands=1&b.stretch=0,255&swipe=0",
  );
  bench.site.judge = () => undefined;
  const actual = await picture(page);
  const { width, height } = actual;
  const pyramid = await Pyramid.open((bench.site.files.get("right.pyr") as { bytes: Uint8Array }).bytes);
  const style = { bands: [0], ranges: [[0, 255]] as [number, number][] };
  assertSame(
    actual,
    await draw(pyramid, { width, height }, { x: 20, y: 15, zoom: 4, level: 0 }, style),
    "by coordinates",
  );
});

test("with fewer pixels each sample that is drawn fills two by two, from the upper left on", async () => {
  // Where each sample has two by two pixels of the screen anyway, the picture is the same.
  for (const [width, height] of [
    [340, 300],
    [341, 301],
  ] as const) {
    await page.setViewportSize({ width, height });
    await go(page, "file=UInt16.pyr&at=60,50&zoom=2&bands=2&stretch=1000,60000");
    const sharp = await picture(page);
    // Its first sample has to begin with such a block.
    const [left, top] = [Math.round(sharp.width / 2 - 120), Math.round(sharp.height / 2 - 100)];
    const link = `at=${60 - (left % 2) / 2},${50 - (top % 2) / 2}`;
    await go(page, `file=UInt16.pyr&${link}&zoom=2&bands=2&stretch=1000,60000`);
    const aligned = await picture(page);
    const pixels = await page.evaluate(() => {
      viewer.time(2);
      const { renderer } = viewer as unknown as { renderer: Renderer };
      return [...renderer.pixels()];
    });
    const [columns, rows] = [Math.ceil(aligned.width / 2), Math.ceil(aligned.height / 2)];
    const expected = new Uint8Array(4 * columns * rows);
    for (let y = 0; y < rows; ++y)
      for (let x = 0; x < columns; ++x) {
        const from = 4 * (2 * y * aligned.width + 2 * x);
        expected.set(aligned.pixels.subarray(from, from + 4), 4 * (y * columns + x));
      }
    const coarse = { width: columns, height: rows };
    assertSame({ ...coarse, pixels: Uint8Array.from(pixels) }, { ...coarse, pixels: expected }, `${width} x ${height}`);
  }
  await page.setViewportSize({ width: 340, height: 300 });
});

test("a resampled view shows samples of the level that is nearest to the pixels of the screen", async () => {
  await compare("UInt16.pyr", "", { bands: [1], ranges: [STRETCHES.UInt16] }, 0.8, 0);
  await compare("UInt16.pyr", "", { bands: [1], ranges: [STRETCHES.UInt16] }, 0.6, 1);
  await compare("UInt16.pyr", "", { bands: [1], ranges: [STRETCHES.UInt16] }, 3, 0);
});

/** A picture file as the browser decodes it, its colours multiplied by alpha. */
async function decoded(path: string): Promise<Picture> {
  bench.site.files.set("reference.png", { bytes: Uint8Array.from(readFileSync(path)), type: "image/png" });
  const { width, height, text } = await page.evaluate(async () => {
    const bitmap = await createImageBitmap(await (await fetch("reference.png")).blob());
    const { width, height } = bitmap;
    const context = new OffscreenCanvas(width, height).getContext("2d") as OffscreenCanvasRenderingContext2D;
    context.drawImage(bitmap, 0, 0);
    const { data } = context.getImageData(0, 0, width, height);
    let text = "";
    for (let i = 0; i < data.length; ++i)
      text += String.fromCharCode(
        i % 4 === 3 ? (data[i] as number) : Math.round(((data[i] as number) * (data[i | 3] as number)) / 255),
      );
    return { width, height, text: btoa(text) };
  });
  return { width, height, pixels: Uint8Array.from(Buffer.from(text, "base64")) };
}

const program = process.env["ZMCRASTER"] ?? "";
const hasPreview = spawnSync(program, ["preview", "--help"]).status === 0;

// What preview is told, and what the link says for the same.
const REFERENCES: [name: string, options: string[], link: string][] = [
  ...TYPES.map((type): [string, string[], string] => {
    const pair = STRETCHES[type].map(String).join(",").replaceAll("e+", "e");
    return [type, ["--bands", "1", `--stretch=${pair}`], `bands=1&stretch=${pair}`];
  }),
  ["Byte", ["--bands", "1,2,3", "--stretch", "20,230;0,255;9,99"], "bands=1,2,3&stretch=20,230;0,255;9,99"],
  // Far from all samples there are.
  [
    "Byte",
    ["--bands", "1,2,3", "--stretch=-3000000,300;4000000,5000000;0,255"],
    "bands=1,2,3&stretch=-3000000,300;4000000,5000000;0,255",
  ],
  [
    "Byte",
    ["--bands", "1,2,3,4", "--stretch", "0,255;0,255;0,255;0,255"],
    "bands=1,2,3&stretch=0,255;0,255;0,255&alpha=4",
  ],
  ["UInt16", ["--bands", "2", "--stretch", "1000,60000", "--gamma", "1.8"], "bands=2&stretch=1000,60000&gamma=1.8"],
  [
    "Int32",
    ["--bands", "1", "--stretch=-2e9,2e9", "--colormap", "viridis"],
    "bands=1&stretch=-2e9,2e9&colormap=viridis",
  ],
  ["Int16", ["--bands", "3", "--stretch=5,5", "--colormap=-turbo"], "bands=3&stretch=5,5&colormap=-turbo"],
  ["Char", ["--bands", "5", "--stretch=90,-90", "--nodata=-5"], "bands=5&stretch=90,-90&nodata=-5"],
  ["Double", ["--bands", "1,2,3", "--stretch=-1,1"], "bands=1,2,3&stretch=-1,1;-1,1;-1,1"],
  ["ComplexSingle", ["--bands", "2", "--stretch=-1,1", "--complex", "real"], "bands=2&stretch=-1,1&complex=real"],
  [
    "ComplexDouble",
    ["--bands", "2", "--stretch=-1,9", "--complex", "imaginary"],
    "bands=2&stretch=-1,9&complex=imaginary",
  ],
  ["phase", ["--stretch=-3.5,3.5", "--complex", "phase"], "bands=1&stretch=-3.5,3.5&complex=phase"],
  ["palette", ["--colormap", "palette"], "bands=1&colormap=palette"],
  // What both take where nothing is told.
  ["archived", ["--bands", "1"], "bands=1"],
  ["archived", ["--bands", "2", "--colormap", "turbo"], "bands=2&colormap=turbo"],
  ["archived", [], ""],
  ["single", [], ""],
];

/** The part of a picture that begins there. */
function partOf({ width, pixels }: Picture, left: number, top: number, columns: number, rows: number): Picture {
  const part = new Uint8Array(4 * columns * rows);
  for (let row = 0; row < rows; ++row) {
    const from = 4 * ((top + row) * width + left);
    part.set(pixels.subarray(from, from + 4 * columns), 4 * columns * row);
  }
  return { width: columns, height: rows, pixels: part };
}

const skip = !hasPreview && "the program has no preview";
test("pictures are those of the program's own renderer", { skip }, async () => {
  for (const [i, [name, options, link]] of REFERENCES.entries()) {
    const bytes = (bench.site.files.get(`${name}.pyr`) as { bytes: Uint8Array }).bytes;
    const { width, height } = (await Pyramid.open(bytes)).header;
    const [source, target] = [`${pyramids.folder}/reference.pyr`, `${pyramids.folder}/${i}.png`];
    writeFileSync(source, bytes);
    const made = spawnSync(program, ["preview", source, target, "--size", String(Math.max(width, height)), ...options]);
    assert.equal(made.status, 0, `${name}: ${made.stderr}`);
    const expected = await decoded(target);
    const [x, y] = [Math.floor(width / 2), Math.floor(height / 2)];
    await go(page, `file=${name}.pyr&at=${x},${y}&zoom=1&${link}`);
    const actual = await picture(page);
    const [left, top] = [Math.round(actual.width / 2 - x), Math.round(actual.height / 2 - y)];
    assertSame(partOf(actual, left, top, width, height), expected, `${name} ${link} beside preview`);
  }
});

test("no page complained", () => assert.deepEqual(bench.complaints, []));
