// The front of a pyramid file and its header document: decoded, judged as a whole, then used.
import { FormatError, LimitError } from "./errors.js";
import { readInteger } from "./numbers.js";
import { type PixelType, TYPES } from "./types.js";
import { parseDocument } from "./xml.js";

/** The order of the tiles in a file. `Scanline` and `Blocked` hold all bands in a tile, `Morton` one. */
export type TileOrdering = "Scanline" | "Blocked" | "Morton";

/** The values of a header document. Sizes are in pixels of level 0. */
export interface Header {
  readonly versionMajor: number;
  readonly versionMinor: number;
  readonly bands: number;
  readonly width: number;
  readonly height: number;
  /** The side of a tile, from 1 to 2048. */
  readonly tileSize: number;
  /** The first and the last level in the file, both inclusive; 0 is the finest, 1023 the last possible. */
  readonly levelMin: number;
  readonly levelMax: number;
  /** Carried for hosts; without effect on the bytes. */
  readonly interleave: "None" | "BIP" | "BIL" | "BSQ";
  readonly tileOrdering: TileOrdering;
  readonly pixelType: PixelType;
}

/** Where the header document begins, in every file. */
export const FRONT_BYTES = 20;
const MAX_TILE_SIZE = 2048;
const MAX_LEVEL = 1023;
const MAX_MORTON_TILES = 65536;
const MAX_TABLE_BYTES = 2 ** 32;

/**
 * Where the tiles begin, from the first bytes of a file of `fileSize` bytes (`undefined`: not known).
 * @throws FormatError, LimitError
 */
export function decodeFront(start: Uint8Array, fileSize: number | undefined, maxHeaderBytes: number): number {
  if (start.length < FRONT_BYTES || String.fromCharCode(...start.subarray(0, 4)) !== "KOBT")
    throw new FormatError("it is no pyramid file");
  const offset = new DataView(start.buffer, start.byteOffset).getBigUint64(4, true);
  if (offset < FRONT_BYTES || offset > (fileSize ?? Infinity))
    throw new FormatError("its header is damaged or was never finished");
  const bytes = Number(offset) - FRONT_BYTES;
  if (bytes > maxHeaderBytes)
    throw new LimitError(`its header has ${bytes} bytes, beyond the limit of ${maxHeaderBytes}`);
  return Number(offset);
}

// Each piece of a text is taken for a whole value, as the module takes it: of two the last counts.
const NUMBERS = new Map([
  ["VERSION_MAJOR", "versionMajor"],
  ["VERSION_MINOR", "versionMinor"],
  ["BANDS", "bands"],
  ["PIXEL_WIDTH", "width"],
  ["PIXEL_HEIGHT", "height"],
  ["TILESIZE", "tileSize"],
  ["LEVELMIN", "levelMin"],
  ["LEVELMAX", "levelMax"],
]);
const WORDS = new Map([
  ["INTERLEAVE", "interleave"],
  ["BUILD_METHOD", "tileOrdering"],
  ["PIXEL_TYPE", "pixelType"],
]);

const wordOf = (text: string): string => /^[ \t\n\v\f\r]*([^ \t\n\v\f\r]*)/.exec(text)?.[1] ?? "";
const oneOf = <T extends string>(word: string, words: readonly T[], other: T): T =>
  words.includes(word as T) ? (word as T) : other;

function readValues(document: Uint8Array): { numbers: Record<string, number>; words: Record<string, string> } {
  const numbers: Record<string, number> = {};
  const words: Record<string, string> = { interleave: "BIP", tileOrdering: "", pixelType: "" };
  const stack: string[] = [];
  for (const key of NUMBERS.values()) numbers[key] = 0;
  parseDocument(document, {
    open: (name) => stack.push(name),
    close: () => stack.pop(),
    text: (piece) => {
      const name = stack[stack.length - 1] as string;
      if (!name.startsWith("HEADER_")) return;
      const number = NUMBERS.get(name.slice(7));
      const word = WORDS.get(name.slice(7));
      if (number) numbers[number] = readInteger(piece);
      if (word) words[word] = wordOf(piece);
    },
  });
  return { numbers, words };
}

/**
 * Reads and judges a header document.
 * @throws FormatError where it is malformed or nobody could read samples by it; LimitError where it claims too much
 */
export function parseHeader(document: Uint8Array, maxBands: number): Header {
  const { numbers, words } = readValues(document);
  const type = words.pixelType === "USHORT" ? "UInt16" : (words.pixelType as string);
  if (!Object.hasOwn(TYPES, type)) throw new FormatError("its pixel type is not known");
  const header = {
    ...numbers,
    interleave: oneOf(words.interleave as string, ["None", "BIP", "BIL", "BSQ"], "None"),
    tileOrdering: oneOf(words.tileOrdering as string, ["Scanline", "Blocked", "Morton"], "Scanline"),
    pixelType: type,
  } as Header;
  judge(header, maxBands);
  return header;
}

function judge(header: Header, maxBands: number): void {
  const { tileSize, levelMin, levelMax, bands } = header;
  if (tileSize === 0 || tileSize > MAX_TILE_SIZE) throw new FormatError(`its tile size is ${tileSize}`);
  if (levelMin > levelMax || levelMax > MAX_LEVEL) throw new FormatError(`its levels are ${levelMin} to ${levelMax}`);
  if (header.tileOrdering === "Morton") judgeTable(header);
  if (!(tileDataBytes(header) <= Number.MAX_SAFE_INTEGER)) throw new LimitError("its sizes are too large");
  if (bands > maxBands) throw new LimitError(`it has ${bands} bands, beyond the limit of ${maxBands}`);
}

// As the module does, for a table that this reader never makes: what one takes the other takes.
function judgeTable({ width, height, tileSize, levelMax, bands }: Header): void {
  const across = tilesOver(width, tileSize);
  const down = tilesOver(height, tileSize);
  const entries = Math.max(across * down, 1) * Math.max(bands, 1) + 1;
  if (across > MAX_MORTON_TILES || down > MAX_MORTON_TILES || entries * (levelMax + 1) * 8 > MAX_TABLE_BYTES)
    throw new FormatError("its sizes are too large");
}

/** Tiles over an extent, in 32 bits: of the last extents below 2^32 no tile is left. */
export const tilesOver = (extent: number, side: number): number => Math.floor(((extent + side - 1) >>> 0) / side);

/** Columns, or rows, of a level: none from level 32 on. */
export const extentAt = (extent: number, level: number): number => (level < 32 ? extent >>> level : 0);

/** Bytes of all tiles of a level. */
export const levelBytes = (header: Header, level: number): number =>
  extentAt(header.width, level) * extentAt(header.height, level) * TYPES[header.pixelType].bytes * header.bands;

/** Bytes of the tiles of all levels above `above`, or of all. Exact up to 2^53. */
export function tileDataBytes(header: Header, above = header.levelMin - 1): number {
  let bytes = 0;
  for (let level = above + 1; level <= header.levelMax; ++level) bytes += levelBytes(header, level);
  return bytes;
}
