// Statistics, histograms, palettes and items of a sidecar, against what the command line tells of the same file.
import assert from "node:assert/strict";
import { writeFileSync } from "node:fs";
import { after, before, test } from "node:test";

import { LimitError, type Metadata, type PixelType, Pyramid } from "zmcraster-web";

import { documentOf, fileOf, headerOf, info, PIXEL_TYPES, Pyramids, randomNumbers } from "./support/pyramids.js";

const pyramids = new Pyramids();
after(() => pyramids.remove());
before(() => {
  const colors = [
    [0, 0, 0, 255],
    [255, 1, 2, 3],
    [9, 8, 7, 6],
  ];
  pyramids.make([
    { name: "built", seed: 1, array: [3, 300, 400] },
    { name: "colored", seed: 2, array: [1, 40, 50], colors },
    { name: "embedded", seed: 3, array: [1, 300, 400], options: ["EMBED=YES"] },
  ]);
});

// As JSON of the command line writes it: large and odd numbers as texts.
function jsonOf(value: number | bigint | undefined): unknown {
  if (value === undefined) return null;
  if (typeof value === "bigint") return value > 2n ** 53n || value < -(2n ** 53n) ? `${value}` : Number(value);
  if (!Number.isFinite(value)) return `${value}`;
  return Number.isInteger(value) && Math.abs(value) > 2 ** 53 ? BigInt(value) : value;
}

// Texts of large numbers may stand for integers or reals: both sides are compared as numbers.
const plain = (value: unknown): unknown =>
  JSON.parse(
    JSON.stringify(value, (_, each: unknown) =>
      typeof each === "bigint"
        ? `${Number(each)}`
        : typeof each === "string" && /^-?\d+$/.test(each)
          ? `${Number(each)}`
          : each === 0
            ? 0
            : typeof each === "number" && Math.abs(each) > 2 ** 53
              ? `${each}`
              : each,
    ),
  );

function told(metadata: Metadata, bands: number): unknown {
  const each = Array.from({ length: bands }, (_, band) => band);
  return plain({
    statistics: each.flatMap((band) => {
      const record = metadata.statistics(band);
      if (!record) return [];
      const { minimum, maximum, mean, standardDeviation, sum, sumOfSquares, rootMeanSquare } = record;
      const values = { minimum, maximum, mean, standardDeviation, sum, sumOfSquares, rootMeanSquare };
      const texts = Object.entries(values).map(([name, value]) => [name, jsonOf(value)]);
      return [{ band: band + 1, ...(Object.fromEntries(texts) as object) }];
    }),
    histograms: metadata.histograms.map(({ band, level, binCount, binSize, minimum, maximum, counts }) => ({
      band: (band + 1) % 2 ** 32,
      level,
      binCount,
      binSize: jsonOf(binSize),
      minimum: jsonOf(minimum),
      maximum: jsonOf(maximum),
      counts: [...counts].map(jsonOf),
    })),
    palettes: each.flatMap((band) => {
      const palette = metadata.palette(band);
      if (!palette) return [];
      const colors = Array.from({ length: palette.length / 4 }, (_, i) => [...palette.subarray(i * 4, i * 4 + 4)]);
      return [{ band: band + 1, colors }];
    }),
  });
}

// Of complex values the imaginary part is 0 in every file: a file keeps the real one alone.
function realParts(records: object): object {
  const isComplex = (name: string, value: unknown): value is unknown[] =>
    /^m..imum$/.test(name) && Array.isArray(value);
  return JSON.parse(
    JSON.stringify(records, (name, value: unknown) => {
      if (!isComplex(name, value)) return value;
      assert.equal(value[1], 0);
      return value[0];
    }),
  ) as object;
}

async function compare(path: string, pyramid: Pyramid): Promise<Metadata> {
  const { statistics, histograms, palettes } = info(path);
  const metadata = await pyramid.metadata();
  assert.deepEqual(told(metadata, pyramid.header.bands), plain(realParts({ statistics, histograms, palettes })));
  return metadata;
}

test("the records of files that were built are those that the command line tells", async () => {
  for (const name of ["built", "colored"]) {
    const metadata = await compare(pyramids.path(name), await Pyramid.open(pyramids.bytes(name)));
    assert.equal(metadata.fault, undefined);
    assert.equal(metadata.sidecar, undefined);
    assert.ok(metadata.statistics(0));
    assert.equal(metadata.statistics(9), undefined);
  }
});

test("what a file keeps of a sidecar is told", async () => {
  const metadata = await compare(pyramids.path("embedded"), await Pyramid.open(pyramids.bytes("embedded")));
  assert.match(metadata.sidecar ?? "", /^<PAMDataset>[^]*<GeoTransform>[^]*5\.0*e\+05|^<PAMDataset>[^]*500000/i);
  assert.match(metadata.sidecar ?? "", /<\/PAMDataset>\s*$/);
});

const stats = (inside: string): string => `<BANDSTATISTICS>${inside}</BANDSTATISTICS>`;
const minimum = (value: string): string => stats(`<RSTC_BAND>0</RSTC_BAND><RSTC_MINIMUM>${value}</RSTC_MINIMUM>`);
const histogram = (bins: string, counts: string, more = ""): string =>
  `<HISTOGRAMS>${more}<HIST_BINCOUNT>${bins}</HIST_BINCOUNT><HIST_COUNTS>${counts}</HIST_COUNTS></HISTOGRAMS>`;
const color = (value: string): string => `<PALETTE_RGBA>${value}</PALETTE_RGBA>`;
const RGBA = color("1|2|3|4");

const ODD: Record<string, string> = {
  "no records": "",
  "statistics of a band twice": minimum("3") + minimum("4"),
  "statistics in another order": stats("<RSTC_BAND>1</RSTC_BAND><RSTC_SUM>1</RSTC_SUM>") + minimum("5"),
  "statistics of all kinds": stats(
    ["MEAN", "STANDARDDEVIATION", "SUM", "SUM2", "RMS", "MAXIMUM", "SUMXY", "COV", "LEVEL"]
      .map((name, i) => `<RSTC_${name}>${i}.25e${i}</RSTC_${name}>`)
      .join(""),
  ),
  "statistics without a band": stats("<RSTC_MEAN>1</RSTC_MEAN>"),
  "statistics within statistics": stats(`<RSTC_MEAN>1</RSTC_MEAN>${minimum("6")}<RSTC_SUM>2</RSTC_SUM>`),
  "statistics without statistics around": "<RSTC_MEAN>1</RSTC_MEAN>",
  "statistics in other elements": `<A><B>${minimum("7")}</B></A>`,
  "a histogram": histogram("3", "1|2|3"),
  "a histogram with too few counts": histogram("3", "1"),
  "a histogram with too many counts": histogram("2", "1|2|3"),
  "a histogram with counts in pieces": histogram("4", "1|2<!-- -->3|4|5"),
  "a histogram with counts before their number":
    "<HISTOGRAMS><HIST_COUNTS>1|2</HIST_COUNTS><HIST_BINCOUNT>2</HIST_BINCOUNT></HISTOGRAMS>",
  "a histogram with two lists": histogram(
    "3",
    "1|2|3",
    "<HIST_BINCOUNT>2</HIST_BINCOUNT><HIST_COUNTS>7|8</HIST_COUNTS>",
  ),
  "a histogram with odd counts": histogram("6", "-1|1e30|1.9||x|18446744073709551615"),
  "a histogram of many bins": histogram("4294967295", "1"),
  "a histogram within another": `<HISTOGRAMS><HIST_BAND>1</HIST_BAND>${histogram("1", "5")}</HISTOGRAMS>`,
  "a histogram with all values": histogram(
    "2",
    "1|2",
    "<HIST_BAND>7</HIST_BAND><HIST_LEVEL>2</HIST_LEVEL><HIST_SOURCE>Native</HIST_SOURCE>" +
      "<HIST_BINSIZE>.5</HIST_BINSIZE><HIST_MIN>-7.9</HIST_MIN><HIST_MAX>300.7</HIST_MAX>",
  ),
  "a palette": `<PALETTE><PALETTE_COUNT>9</PALETTE_COUNT>${RGBA}${color("300|-1|2.9|x|5")}${color("7")}</PALETTE>`,
  "two palettes of a band": `<PALETTE>${RGBA}</PALETTE><PALETTE>${color("5|6|7|8")}</PALETTE>`,
  "a palette without colors behind another": `<PALETTE>${RGBA}</PALETTE><PALETTE></PALETTE>`,
  "a palette of the band before": `<PALETTE><PALETTE_BAND>1</PALETTE_BAND></PALETTE><PALETTE>${RGBA}</PALETTE>`,
  "a palette within another": `<PALETTE>${RGBA}<PALETTE><PALETTE_BAND>1</PALETTE_BAND>${RGBA}</PALETTE>${color("9")}</PALETTE>`,
  "colors without a palette": `${RGBA}<PALETTE>${color("9")}</PALETTE>`,
  "an empty color": `<PALETTE><PALETTE_RGBA/>${RGBA}</PALETTE>`,
  "a color of an empty section": `<PALETTE>${color("<![CDATA[]]>")}</PALETTE>`,
  "values of a header": "<HEADER_BANDS>9</HEADER_BANDS>" + minimum("1"),
  "a document type": "<!DOCTYPE A>",
  "a tag that stays open": minimum("1") + "<A>",
};
const NUMBERS = [
  "3.7",
  "300",
  "-5",
  "-129",
  "1e10",
  "1e19",
  "1e20",
  "-1e19",
  "9223372036854775807",
  "18446744073709551615",
];
NUMBERS.push(
  "nan",
  "inf",
  "-infinity",
  "0x10",
  "0x.8",
  "0x1p-3",
  "0x1.fffffffffffff8p0",
  "1e-400",
  "1e400",
  " +1.5",
  "1,5",
);
NUMBERS.push(
  "1234567.5",
  "0.1",
  "-0.0",
  "--1",
  "x",
  "0x",
  "1e",
  "1e+",
  ".5",
  "5.",
  ".",
  "0X1P+2",
  "0x123456789abcdef123p-4",
);

function withMetadata(document: string | Uint8Array, type: PixelType = "Byte"): Uint8Array {
  const header = headerOf({ PIXEL_WIDTH: 1, PIXEL_HEIGHT: 1, BANDS: 2, PIXEL_TYPE: type });
  const bytes = { Byte: 1, Char: 1, UInt16: 2, Int16: 2, UInt32: 4, Int32: 4, Single: 4, ComplexDouble: 16 } as Record<
    string,
    number
  >;
  const data = new Uint8Array(2 * (bytes[type] ?? 8));
  return fileOf(documentOf(header), Buffer.concat([data, Buffer.from(document)]));
}

async function compareBytes(bytes: Uint8Array): Promise<Metadata> {
  const path = pyramids.path("odd");
  writeFileSync(path, bytes);
  return compare(path, await Pyramid.open(bytes));
}

for (const [name, inside] of Object.entries(ODD))
  test(`a document with ${name} tells what the command line finds in it`, async () => {
    const type = name.includes("all values") ? "Int16" : "Byte";
    await compareBytes(withMetadata(`<DATASET>${inside}</DATASET>\n\n`, type));
  });

for (const type of PIXEL_TYPES)
  test(`numbers of all spellings are those that the command line reads as ${type}`, async () => {
    // A histogram for each, since of statistics there is one for a band.
    const records = NUMBERS.map((value) =>
      histogram("0", "", `<HIST_MIN>${value}</HIST_MIN><HIST_BINSIZE>${value}</HIST_BINSIZE>`),
    );
    await compareBytes(withMetadata(`<DATASET>${minimum("1.5")}${records.join("")}</DATASET>`, type));
  });

test("bins that no entry stands for are few enough to be made", async () => {
  const records = histogram("1048577", "1") + histogram("2", "1") + histogram("2", "1|2");
  const { histograms } = await (await Pyramid.open(withMetadata(`<DATASET>${records}</DATASET>`))).metadata();
  assert.deepEqual(
    histograms.map(({ counts }) => counts.length),
    [1048577, 0, 2],
  );
});

test("a document that is not believed tells its fault and nothing else", async () => {
  const good = `<DATASET>${minimum("1")}<PALETTE>${RGBA}</PALETTE></DATASET>`;
  const bad = [
    good.slice(0, -1),
    `\u001A${good.slice(1)}`,
    "  \n",
    good.replaceAll("DATASET", "OTHER"),
    good + "\0",
    good + "ä",
  ];
  for (const document of bad) {
    const metadata = await compareBytes(withMetadata(document));
    assert.match(metadata.fault ?? "", /^the metadata document is malformed: .+$/, JSON.stringify(document));
    assert.equal(metadata.palette(0), undefined);
    assert.deepEqual(metadata.histograms, []);
  }
  assert.equal((await compareBytes(withMetadata(""))).fault, undefined);
});

test("a document cut anywhere is not believed", async () => {
  const document = `<DATASET>${minimum("1")}</DATASET>`;
  for (let size = 1; size < document.length; ++size) {
    const pyramid = await Pyramid.open(withMetadata(document.slice(0, size)));
    assert.ok((await pyramid.metadata()).fault, document.slice(0, size));
  }
});

test("a document beyond maxDocumentBytes is refused unread", async () => {
  const bytes = withMetadata(`<DATASET>${" ".repeat(30000)}</DATASET>`);
  const asked: number[] = [];
  const read = async (offset: number, length: number): Promise<Uint8Array> => {
    asked.push(offset);
    return bytes.slice(offset, offset + length);
  };
  const pyramid = await Pyramid.open({ size: bytes.length, read }, { maxDocumentBytes: 20000 });
  await assert.rejects(pyramid.metadata(), LimitError);
  const unknown = await Pyramid.open({ read }, { maxDocumentBytes: 20000 });
  await assert.rejects(unknown.metadata(), LimitError);
  assert.deepEqual(asked, [0, 0, unknown.tileDataEnd]);
});

test("metadata is one request, and asked for once", async () => {
  const bytes = pyramids.bytes("built");
  const asked: number[][] = [];
  const read = async (offset: number, length: number): Promise<Uint8Array> => {
    asked.push([offset, length]);
    return bytes.slice(offset, offset + length);
  };
  const pyramid = await Pyramid.open({ size: bytes.length, read });
  const [first, second] = await Promise.all([pyramid.metadata(), pyramid.metadata()]);
  assert.equal(first, second);
  await pyramid.metadata();
  assert.deepEqual(asked.slice(1), [[pyramid.tileDataEnd, bytes.length - pyramid.tileDataEnd]]);
  const tail = await (await Pyramid.open({ read })).metadata();
  assert.deepEqual(tail.statistics(2), first.statistics(2));
});

test("a megabyte of hostile text is judged in time", async () => {
  const texts = [
    `<DATASET>${"&amp;".repeat(200000)}</DATASET>`,
    `<DATASET>${"<![CDATA[]]>".repeat(90000)}</DATASET>`,
    `<DATASET>${"<PALETTE>".repeat(60)}${RGBA.repeat(30000)}${"</PALETTE>".repeat(60)}</DATASET>`,
    `<DATASET>${histogram("1000000", "1|".repeat(500000))}</DATASET>`,
    `<DATASET>${histogram("5", "<A/>1|2".repeat(150000))}</DATASET>`,
    `<DATASET ${"a ".repeat(500000)}></DATASET>`,
    `<DATASET a="${"&lt;".repeat(250000)}"/>`,
    "<".repeat(1000000),
    `<${"a".repeat(1000000)}>`,
    `<DATASET>${"]".repeat(1000000)}</DATASET>`,
    `<DATASET>${"<!--".repeat(250000)}`,
    `<DATASET>${minimum("9".repeat(1000000))}${minimum("0x" + "f".repeat(1000000))}${minimum(" ".repeat(1000000))}</DATASET>`,
    `<?xml version="1.${"0".repeat(1000000)}"?><DATASET/>`,
  ];
  for (const text of texts) {
    const pyramid = await Pyramid.open(withMetadata(text));
    const started = performance.now();
    await pyramid.metadata();
    assert.ok(performance.now() - started < 4000, `${text.slice(0, 60)}: ${performance.now() - started} ms`);
  }
});

test("documents that were changed at random never do more than tell a fault", async () => {
  const document = Buffer.from(`<DATASET>${Object.values(ODD).slice(0, 20).join("\n")}</DATASET>`);
  let believed = 0;
  for (let seed = 0; seed < 400; ++seed) {
    const next = randomNumbers(seed);
    const bytes = Buffer.from(document);
    for (let i = next() % 3; i >= 0; --i) {
      const at = next() % bytes.length;
      const isDigit = /\d/.test(String.fromCharCode(bytes[at] as number));
      bytes[at] = isDigit ? 48 + (next() % 10) : next() % 4 ? (bytes[at] as number) : 32 + (next() % 96);
    }
    const { fault } = await (await Pyramid.open(withMetadata(bytes))).metadata();
    if (fault === undefined) believed++;
    else assert.ok(!fault.includes("\n"));
  }
  assert.ok(believed > 20 && believed < 400, `${believed}`);
});
