// Pyramid files of tests, made by others: the program and the driver of this project, and GDAL.
import { spawnSync } from "node:child_process";
import { mkdtempSync, readFileSync, rmSync } from "node:fs";
import { tmpdir } from "node:os";
import { join } from "node:path";

import type { PixelType, TileOrdering } from "zmcraster-web";

/** The twelve types, told once more for tests: a test that asked the reader for them would not miss one. */
export const PIXEL_TYPES: readonly PixelType[] = [
  "Byte",
  "Char",
  "UInt16",
  "Int16",
  "UInt32",
  "Int32",
  "UInt64",
  "Int64",
  "Single",
  "Double",
  "ComplexSingle",
  "ComplexDouble",
];

/** What the environment has to tell: see run-tests. */
function setting(name: string): string {
  const value = process.env[name];
  if (!value) throw new Error(`${name} is not set: these tests are started by run-tests, or by ctest`);
  return value;
}

export interface HeaderValues {
  VERSION_MAJOR: number;
  VERSION_MINOR: number;
  BANDS: number;
  PIXEL_HEIGHT: number;
  PIXEL_WIDTH: number;
  LEVELMIN: number;
  LEVELMAX: number;
  TILESIZE: number;
  INTERLEAVE: string;
  BUILD_METHOD: TileOrdering;
  PIXEL_TYPE: PixelType;
}

export function headerOf(values: Partial<HeaderValues> = {}): HeaderValues {
  const usual = { VERSION_MAJOR: 1, VERSION_MINOR: 1, BANDS: 1, PIXEL_HEIGHT: 100, PIXEL_WIDTH: 130, LEVELMIN: 0 };
  const rest = { LEVELMAX: 0, TILESIZE: 64, INTERLEAVE: "BIP", BUILD_METHOD: "Blocked", PIXEL_TYPE: "Byte" } as const;
  return { ...usual, ...rest, ...values };
}

export function documentOf(header: object): string {
  const elements = Object.entries(header).map(([name, value]) => `<HEADER_${name}>${value}</HEADER_${name}>`);
  return `<?xml version="1.0"?><DATASET><HEADER>${elements.join("")}</HEADER></DATASET>`;
}

/** The first bytes of a file with that header document, and `behind` behind them. */
export function fileOf(document: string | Uint8Array, behind: Uint8Array | string = ""): Uint8Array<ArrayBuffer> {
  const text = Buffer.from(document);
  const front = Buffer.alloc(20);
  front.write("KOBT", "latin1");
  front.writeBigUInt64LE(BigInt(20 + text.length), 4);
  return Uint8Array.from(Buffer.concat([front, text, Buffer.from(behind)]));
}

export type Job =
  | { name: string; seed: number; header: HeaderValues; cut?: number }
  | { name: string; seed: number; array: [number, number, number]; options?: string[]; colors?: number[][] }
  | { name: string; headers: string[] };

/** A folder of files, which goes with `remove`. */
export class Pyramids {
  readonly folder = mkdtempSync(join(tmpdir(), "zmcraster-web-"));

  make(jobs: Job[]): Record<string, unknown[]> {
    const script = join(setting("ZMC_WEB_SOURCE"), "test/support/pyramids.py");
    const input = JSON.stringify(jobs);
    const python = spawnSync("/usr/bin/python3", ["-B", script, this.folder], { input, maxBuffer: 2 ** 28 });
    if (python.status !== 0) throw new Error(`${python.stderr}`);
    return JSON.parse(`${python.stdout}`) as Record<string, unknown[]>;
  }

  path(name: string): string {
    return join(this.folder, `${name}.pyr`);
  }

  bytes(name: string): Uint8Array<ArrayBuffer> {
    return Uint8Array.from(readFileSync(this.path(name)));
  }

  /** The samples of a level, band by band. */
  expected(name: string, level: number): Uint8Array {
    return Uint8Array.from(readFileSync(join(this.folder, `${name}.${level}.raw`)));
  }

  remove(): void {
    rmSync(this.folder, { recursive: true, force: true });
  }
}

/** What the command line tells of a file. */
export function info(file: string): Record<string, never> {
  const program = spawnSync(setting("ZMCRASTER"), ["info", "--json", file], { maxBuffer: 2 ** 28 });
  if (program.status !== 0) throw new Error(`${program.stderr}`);
  return JSON.parse(`${program.stdout}`) as Record<string, never>;
}

/** Numbers from 0 to 2^32 - 1, the same for one seed. */
export function randomNumbers(seed: number): () => number {
  let state = seed >>> 0;
  return () => {
    state = (state + 0x9e3779b9) >>> 0;
    let mixed = Math.imul(state ^ (state >>> 16), 0x21f0aaad);
    mixed = Math.imul(mixed ^ (mixed >>> 15), 0x735a2d97);
    return (mixed ^ (mixed >>> 15)) >>> 0;
  };
}
