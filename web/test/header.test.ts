// Headers that are odd or hostile: what the module's own parser takes is taken, with the same values, and what
// it refuses is refused; and none takes long.
import assert from "node:assert/strict";
import { after, before, test } from "node:test";

import { FormatError, type Level, LimitError, Pyramid, PyramidError } from "zmcraster-web";

import { documentOf, fileOf, headerOf, Pyramids, randomNumbers } from "./support/pyramids.js";

const pyramids = new Pyramids();
after(() => pyramids.remove());

const TYPES: Record<string, string> = {
  Byte: "Byte",
  Char: "Int16", // GDAL has no signed bytes here
  UInt16: "UInt16",
  Int16: "Int16",
  UInt32: "UInt32",
  Int32: "Int32",
  UInt64: "UInt64",
  Int64: "Int64",
  Single: "Float32",
  Double: "Float64",
  ComplexSingle: "CFloat32",
  ComplexDouble: "CFloat64",
};

type Judgement = [number, number, number, string | null, number | null] | string;

// As the driver tells of it: the size of the first level, bands, type, tile.
async function judge(document: Uint8Array): Promise<Judgement> {
  try {
    const { header, levels } = await Pyramid.open(fileOf(document));
    const first = levels[0] as Level;
    if (!first.width || !first.height) return "no pixels";
    const type = header.bands ? (TYPES[header.pixelType] as string) : null;
    return [first.width, first.height, header.bands, type, header.bands ? header.tileSize : null];
  } catch (error) {
    assert.ok(error instanceof PyramidError, `${String(error)}`);
    assert.ok(error instanceof FormatError || error instanceof LimitError, `${error.name}`);
    assert.ok(!error.message.includes("\n"), error.message);
    return error.message;
  }
}

const usual = headerOf({ LEVELMAX: 2, BANDS: 3, PIXEL_TYPE: "Int16" });
const text = documentOf(usual);
const replaced = (from: string | RegExp, to: string): string => {
  const changed = text.replace(from, to);
  assert.notEqual(changed, text);
  return changed;
};
const width = (value: string): string => replaced(">130<", `>${value}<`);
const word = (value: string): string => replaced(">Int16<", `>${value}<`);
const within = (inside: string): string => replaced("<HEADER>", `<HEADER>${inside}`);

const ODD: Record<string, string> = {
  "as usual": text,
  "without a declaration": replaced('<?xml version="1.0"?>', ""),
  "of XML 1.1": replaced("1.0", "1.1"),
  "of XML 2.0": replaced("1.0", "2.0"),
  "with a byte order mark": "\uFEFF" + text,
  "with all of a declaration": replaced('"1.0"', "'1.0' encoding='utf-8' standalone='no' "),
  "with a declaration out of order": replaced('"1.0"', '"1.0" standalone="no" encoding="UTF-8"'),
  "with a text behind the root": text + "x",
  "with line ends behind the root": text + "\r\n \t\n",
  "with a comment and an instruction behind the root": text + "<!-- a --><?b c?>",
  "with two roots": text + "<A/>",
  "cut off": text.slice(0, -5),
  "of another root": text.replaceAll("DATASET", "OTHER"),
  "of other elements around": text.replaceAll("HEADER>", "OTHER>"),
  "with attributes": replaced("<HEADER>", "<HEADER a='1' b = \"2>\" c='&lt;&#10;'>"),
  "with an attribute twice": replaced("<HEADER>", "<HEADER a='1' a='2'>"),
  "with an attribute without quotes": replaced("<HEADER>", "<HEADER a=1>"),
  "with an attribute without a value": replaced("<HEADER>", "<HEADER a>"),
  "with attributes that touch": replaced("<HEADER>", "<HEADER a='1'b='2'>"),
  "with < in an attribute": replaced("<HEADER>", "<HEADER a='<'>"),
  "with an entity in an attribute": replaced("<HEADER>", "<HEADER a='&b;'>"),
  "with 64 attributes": replaced("<HEADER>", `<HEADER ${Array.from({ length: 64 }, (_, i) => `a${i}=''`).join(" ")}>`),
  "with 65 attributes": replaced("<HEADER>", `<HEADER ${Array.from({ length: 65 }, (_, i) => `a${i}=''`).join(" ")}>`),
  "with a document type": replaced("<DATASET>", "<!DOCTYPE DATASET><DATASET>"),
  "with a document type of entities": replaced("<DATASET>", '<!DOCTYPE D [<!ENTITY a "b">]><DATASET>'),
  "with an entity": within("&a;"),
  "with & by itself": within(" & "),
  "with comments": within("<!-- <HEADER_BANDS>9</HEADER_BANDS> -->"),
  "with -- in a comment": within("<!-- a -- b -->"),
  "with a comment of three dashes": within("<!-- a --->"),
  "with an empty comment": within("<!---->"),
  "with an instruction": within("<?a b?>"),
  "with a declaration inside": within("<?xml version='1.0'?>"),
  "with CDATA": within("<![CDATA[ <x> ]]>"),
  "with CDATA outside of the root": text + "<![CDATA[x]]>",
  "with ]]> in a text": within("]]>"),
  "with a control character": within("\u0001"),
  "with a NUL": within("\0"),
  "with a NUL at the end": text + "\0",
  "with a reference to a NUL": within("&#0;"),
  "with a reference to a control character": within("&#1;"),
  "with a reference beyond Unicode": within("&#x110000;"),
  "with a reference to half a pair": within("&#xD800;"),
  "with a reference to a long number": within("&#99999999999999999999;"),
  "with a reference to a character of two units": within("&#x1F600;"),
  "with another character of two units": within("\u{1F600}"),
  "with an unknown element": within("<OTHER>7<HEADER_BANDS>4</HEADER_BANDS></OTHER>"),
  "with a known element that is empty": within("<HEADER_BANDS/>"),
  "with a value twice": replaced("</HEADER>", "<HEADER_BANDS>4</HEADER_BANDS></HEADER>"),
  "with a value outside": replaced("</DATASET>", "<HEADER_BANDS>4</HEADER_BANDS></DATASET>"),
  "with a name in other letters": replaced("<HEADER>", "<header>"),
  "with tags that cross": replaced("</HEADER></DATASET>", "</DATASET></HEADER>"),
  "with blanks in tags": text.replaceAll("</HEADER_BANDS>", "</HEADER_BANDS \n>").replace("<HEADER>", "<HEADER\t>"),
  "with a blank before a name": replaced("<HEADER>", "< HEADER>"),
  "with a name that begins with a digit": within("<1A/>"),
  "with a name of other letters": within("<Größe·1/>"),
  "with a colon in a name": within("<a:b/>"),
  "with 256 unknown names": within(Array.from({ length: 256 }, (_, i) => `<N${i}/>`).join("")),
  "with 257 unknown names": within(Array.from({ length: 257 }, (_, i) => `<N${i}/>`).join("")),
  "of depth 64": within("<A>".repeat(62) + "</A>".repeat(62)),
  "of depth 65": within("<A>".repeat(63) + "</A>".repeat(63)),
  "with a number in pieces": width("1<!-- -->2"),
  "with a number and a reference": width("1&#50;3"),
  "with a number in CDATA": width("<![CDATA[12]]>"),
  "with a number and empty CDATA": width("12<![CDATA[]]>"),
  "with a number, CDATA and a blank": width("12<![CDATA[13]]> "),
  "with an element in a number": width("1<A/>2"),
  "with a signed number": width("+7"),
  "with blanks around a number": width(" \n\t 8 x"),
  "with a real number": width("9.9e9"),
  "with a hexadecimal number": width("0x10"),
  "with no number": width("x9"),
  "with a number beyond 32 bits": width("4294967301"),
  "with a number beyond 64 bits": width("99999999999999999999999"),
  "with two signs": width("--7"),
  "with a number of a million digits": width("0".repeat(900000) + "7"),
  "with a no-break space before a number": width("\u00A07"),
  "with a word and what follows": word(" UInt16 x"),
  "with USHORT": word("USHORT"),
  "with a word in other letters": word("uint16"),
  "with a word of an object": word("constructor"),
  "with a type without a reader": word("Quad"),
  "with an unknown ordering": replaced(">Blocked<", ">Other<"),
  "with another interleave": replaced(">BIP<", ">?<"),
  "without a tile size": replaced(">64<", ">0<"),
  "with a tile size of 2048": replaced(">64<", ">2048<"),
  "with a tile size of 2049": replaced(">64<", ">2049<"),
  "with levels to 1023": replaced("LEVELMAX>2<", "LEVELMAX>1023<"),
  "with levels to 1024": replaced("LEVELMAX>2<", "LEVELMAX>1024<"),
  "with no level": replaced("LEVELMIN>0<", "LEVELMIN>3<"),
  "with 65536 bands": replaced("BANDS>3<", "BANDS>65536<"),
  "with 65537 bands": replaced("BANDS>3<", "BANDS>65537<"),
  "in ISO-8859-1": replaced('"1.0"', '"1.0" encoding="ISO-8859-1"').replace("<HEADER>", "<HEADER>ä"),
  "in US-ASCII": replaced('"1.0"', '"1.0" encoding="us-ascii"'),
  "in US-ASCII with another sign": replaced('"1.0"', '"1.0" encoding="US-ASCII"').replace("<HEADER>", "<HEADER>ä"),
  "in UTF-16, as it says": replaced('"1.0"', '"1.0" encoding="UTF-16"'),
  "in an encoding that nobody knows": replaced('"1.0"', '"1.0" encoding="X-NONE"'),
  "of nothing but blanks": "<!-- --> ",
};

const names = Object.keys(ODD);
const latin1 = new Set(["in ISO-8859-1"]);
const bytesOf = (name: string): Uint8Array =>
  Uint8Array.from(Buffer.from(ODD[name] as string, latin1.has(name) ? "latin1" : "utf8"));

const FRAGMENTS = [
  "<!-- 5 -->",
  "<![CDATA[5]]>",
  "<![CDATA[]]>",
  "<?a 5?>",
  "<A/>",
  "<A b='5'>5</A>",
  "&#53;",
  "&lt;",
  "&amp;5",
  "&x;",
  "]]>",
  "\u00E4",
  "\r\n",
  "5",
  " ",
  "<HEADER_BANDS>2</HEADER_BANDS>",
  "<HEADER_PIXEL_WIDTH>",
  "</HEADER>",
  "<",
  "\u0001",
];
const VALUES = ["0", "1", " 77 x", "-1", "+3", "0x8", "1e2", "99999999999", "Byte", "Morton", "\tDouble", "inf", ""];

// One, two or three changes of bytes, values or pieces, the same for one seed.
function mutated(seed: number): Uint8Array {
  const next = randomNumbers(seed);
  const one = <T>(list: readonly T[]): T => list[next() % list.length] as T;
  const odd = names.filter((name) => (ODD[name] as string).length < 2000);
  let whole = ODD[next() % 2 ? "as usual" : one(odd)] as string;
  for (let changes = 1 + (next() % 3); changes > 0; --changes) {
    const gaps = [...whole.matchAll(/>/g)].map(({ index }) => index + 1);
    const at = next() % 3 ? one(gaps.length ? gaps : [0]) : next() % (whole.length + 1);
    const kind = next() % 8;
    if (kind < 4) whole = whole.slice(0, at) + one(FRAGMENTS) + whole.slice(at);
    else if (kind < 7) whole = whole.slice(0, at) + whole.slice(at).replace(/>[^<]+</, `>${one(VALUES)}<`);
    else whole = whole.slice(0, at) + whole.slice(at + 1 + (next() % 6));
  }
  const bytes = Uint8Array.from(Buffer.from(whole, "utf8"));
  if (next() % 8 === 0 && bytes.length) bytes[next() % bytes.length] = next() & 0xff;
  return bytes;
}

const MUTATIONS = 3000;
let told: Judgement[] = [];
let toldOfMutations: Judgement[] = [];
const hex = (bytes: Uint8Array): string => Buffer.from(bytes).toString("hex");

before(() => {
  const answers = pyramids.make([
    { name: "odd", headers: names.map((name) => hex(bytesOf(name))) },
    { name: "mutated", headers: Array.from({ length: MUTATIONS }, (_, seed) => hex(mutated(seed))) },
  ]);
  told = answers.odd as Judgement[];
  toldOfMutations = answers.mutated as Judgement[];
});

// GDAL shows less than there can be: nothing without pixels, and no more than 2^31 of them in a row.
function compare(document: Uint8Array, ours: Judgement, theirs: Judgement): void {
  const context = `${JSON.stringify(theirs)}, here ${JSON.stringify(ours)}: ${Buffer.from(document).toString("latin1").slice(0, 900)}`;
  if (typeof theirs !== "string") assert.deepEqual(ours, theirs, context);
  else if (theirs.includes("cannot show it to GDAL"))
    assert.ok(typeof ours !== "string" || ours === "no pixels", context);
  else assert.equal(typeof ours, "string", context);
}

for (const [i, name] of names.entries())
  test(`a header ${name} is taken as the module takes it`, async () => {
    const document = bytesOf(name);
    compare(document, await judge(document), told[i] as Judgement);
  });

test("headers that were changed at random are taken as the module takes them", async () => {
  let taken = 0;
  for (let seed = 0; seed < MUTATIONS; ++seed) {
    const document = mutated(seed);
    compare(document, await judge(document), toldOfMutations[seed] as Judgement);
    if (typeof toldOfMutations[seed] !== "string") taken++;
  }
  assert.ok(taken > MUTATIONS / 8 && taken < MUTATIONS / 2, `${taken} were taken`);
});

test("elements named as what every object has come into no header", async () => {
  const document = within("<HEADER_constructor>1</HEADER_constructor><HEADER___proto__>2</HEADER___proto__>");
  const { header } = await Pyramid.open(fileOf(document));
  const { header: plain } = await Pyramid.open(fileOf(text));
  assert.deepEqual(header, plain);
  assert.deepEqual(Object.keys(header), Object.keys(plain));
});

test("a front that is damaged is refused", async () => {
  const whole = fileOf(text);
  for (let size = 0; size < whole.length; ++size) {
    const reason = size < 20 ? /no pyramid/ : /damaged/;
    await assert.rejects(Pyramid.open(whole.slice(0, size)), (error: Error) => reason.test(error.message));
  }
  for (const offset of [0n, 19n, 2n ** 63n, 2n ** 64n - 1n]) {
    const bytes = whole.slice();
    new DataView(bytes.buffer).setBigUint64(4, offset, true);
    await assert.rejects(Pyramid.open(bytes), FormatError);
  }
  whole[0] = 0;
  await assert.rejects(Pyramid.open(whole), FormatError);
});

test("a file that claims gigabytes of header is refused unread", async () => {
  const asked: number[] = [];
  const start = fileOf(text);
  new DataView(start.buffer).setBigUint64(4, 2n ** 33n, true);
  const read = async (_offset: number, length: number): Promise<Uint8Array> => {
    asked.push(length);
    return start.slice();
  };
  await assert.rejects(Pyramid.open({ size: 2 ** 40, read }), LimitError);
  assert.deepEqual(asked, [16384]);
});

test("what claims more than its bytes opens and is refused where memory would be taken", async () => {
  const huge = headerOf({
    PIXEL_WIDTH: 2 ** 26,
    PIXEL_HEIGHT: 2 ** 26,
    TILESIZE: 2048,
    BANDS: 100,
    BUILD_METHOD: "Scanline",
  });
  await assert.rejects(Pyramid.open(fileOf(documentOf({ ...huge, BANDS: 65536 }))), LimitError);
  await assert.rejects(Pyramid.open(fileOf(documentOf({ ...huge, BANDS: 65536 })), { maxBands: 100 }), LimitError);
  const pyramid = await Pyramid.open(fileOf(documentOf({ ...huge, PIXEL_WIDTH: 2 ** 20 })));
  await assert.rejects(pyramid.readTile(0, 0, 0), LimitError);
  await assert.rejects(pyramid.readTile(0, 0, 0, { bands: [0] }), LimitError);
});

test("tiles of one pixel are refused where they are too many, and let go of in time", async () => {
  const header = headerOf({ PIXEL_WIDTH: 2 ** 14, PIXEL_HEIGHT: 2 ** 14, TILESIZE: 1 });
  const head = fileOf(documentOf(header));
  const read = (offset: number, length: number, signal?: AbortSignal): Promise<Uint8Array> =>
    new Promise((resolve, reject) => {
      if (offset === 0) return resolve(Uint8Array.from(Buffer.concat([head, Buffer.alloc(length)])).slice(0, length));
      signal?.addEventListener("abort", () => reject(signal.reason));
    });
  for (const maxGap of [16384, -1]) {
    const pyramid = await Pyramid.open({ size: head.length + 2 ** 28, read }, { maxGap });
    const started = performance.now();
    await assert.rejects(pyramid.readWindow(0, { x: 0, y: 0, width: 2 ** 14, height: 2 ** 14 }), LimitError);
    const abort = new AbortController();
    const window = pyramid.readWindow(0, { x: 0, y: 99, width: 2 ** 14, height: 4 }, { signal: abort.signal });
    setTimeout(() => abort.abort(), 1);
    await assert.rejects(window, { name: "AbortError" });
    assert.ok(performance.now() - started < 10000, `${performance.now() - started} ms`);
  }
});

test("a million elements in a header are read within seconds, and one more is refused", async () => {
  const started = performance.now();
  const many = (count: number) => fileOf(within("<A/>".repeat(count)));
  const options = { maxHeaderBytes: 2 ** 23 };
  const others = 13; // DATASET, HEADER and eleven values
  assert.equal((await Pyramid.open(many(2 ** 20 - others), options)).header.bands, 3);
  await assert.rejects(Pyramid.open(many(2 ** 20 - others + 1), options), FormatError);
  assert.ok(performance.now() - started < 20000);
});

test("the largest grid along the Morton curve opens at once, and its last tile is found", async () => {
  const started = performance.now();
  const header = headerOf({ PIXEL_WIDTH: 65536, PIXEL_HEIGHT: 8191, TILESIZE: 1, BUILD_METHOD: "Morton" });
  const asked: number[] = [];
  const head = fileOf(documentOf(header));
  const size = head.length + 65536 * 8191;
  const read = async (offset: number, length: number): Promise<Uint8Array> => {
    asked.push(offset);
    return offset
      ? new Uint8Array(length)
      : Uint8Array.from(Buffer.concat([head, new Uint8Array(16384)])).slice(0, length);
  };
  const pyramid = await Pyramid.open({ size, read });
  await pyramid.readTile(0, 65535, 8190);
  assert.deepEqual(asked, [0, size - 1]);
  assert.ok(performance.now() - started < 5000);
});
