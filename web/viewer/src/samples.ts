// How samples go to the graphics processor: as they are where it knows their type; those of 64 bits as 32-bit reals,
// counted from a value near the stretch.
import type { PixelType, SampleArray } from "../../src/types.js";
import { isComplex, isNone, type Range } from "./style.js";

export type Sampler = "usampler2D" | "isampler2D" | "sampler2D";

/** How a texture holds the samples of a type. */
export interface Format {
  sampler: Sampler;
  /** Internal format and format of the texture, by its number of channels less one. */
  layouts: readonly (readonly [internal: GLenum, format: GLenum])[];
  type: GLenum;
  /** Bytes of one channel on the graphics processor. */
  bytes: number;
  /** Whether samples have to be converted. */
  converted: boolean;
}

const GL = WebGL2RenderingContext;
const integers = (names: readonly GLenum[]): Format["layouts"] => {
  const formats = [GL.RED_INTEGER, GL.RG_INTEGER, GL.RGB_INTEGER, GL.RGBA_INTEGER];
  return names.map((internal, i) => [internal, formats[i] as GLenum]);
};
const reals: Format["layouts"] = [
  [GL.R32F, GL.RED],
  [GL.RG32F, GL.RG],
  [GL.RGB32F, GL.RGB],
  [GL.RGBA32F, GL.RGBA],
];
const unsigned = (names: readonly GLenum[], type: GLenum, bytes: number): Format => ({
  sampler: "usampler2D",
  layouts: integers(names),
  type,
  bytes,
  converted: false,
});
const signed = (names: readonly GLenum[], type: GLenum, bytes: number): Format => ({
  ...unsigned(names, type, bytes),
  sampler: "isampler2D",
});
const real: Format = { sampler: "sampler2D", layouts: reals, type: GL.FLOAT, bytes: 4, converted: false };
const wide: Format = { ...real, converted: true };

const FORMATS: Record<PixelType, Format> = {
  Byte: unsigned([GL.R8UI, GL.RG8UI, GL.RGB8UI, GL.RGBA8UI], GL.UNSIGNED_BYTE, 1),
  Char: signed([GL.R8I, GL.RG8I, GL.RGB8I, GL.RGBA8I], GL.BYTE, 1),
  UInt16: unsigned([GL.R16UI, GL.RG16UI, GL.RGB16UI, GL.RGBA16UI], GL.UNSIGNED_SHORT, 2),
  Int16: signed([GL.R16I, GL.RG16I, GL.RGB16I, GL.RGBA16I], GL.SHORT, 2),
  UInt32: unsigned([GL.R32UI, GL.RG32UI, GL.RGB32UI, GL.RGBA32UI], GL.UNSIGNED_INT, 4),
  Int32: signed([GL.R32I, GL.RG32I, GL.RGB32I, GL.RGBA32I], GL.INT, 4),
  UInt64: wide,
  Int64: wide,
  Single: real,
  Double: wide,
  ComplexSingle: real,
  ComplexDouble: wide,
};

export const formatOf = (type: PixelType): Format => FORMATS[type];

/** A converted sample is (value - base) / unit. The base of integers is a whole number. */
export interface Conversion {
  base: number;
  unit: number;
  noData: number | bigint | undefined;
}

const PRECISION = 2 ** 13; // stretches that keep 1/2048 of their range exact, beside the 24 bits of a real

/** The conversion that suits a stretch; the one there is, as long as it is exact enough. */
export function conversionFor(
  type: PixelType,
  range: Range,
  noData: number | bigint | undefined,
  now?: Conversion,
): Conversion {
  if (isComplex(type)) return { base: 0, unit: unitOf(range), noData };
  const extent = Math.abs(range.maximum - range.minimum);
  if (now && Object.is(now.noData, noData)) {
    const far = Math.max(Math.abs(range.minimum - now.base), Math.abs(range.maximum - now.base));
    if (far === 0 || far / extent < PRECISION) return now;
  }
  const base = type === "Double" ? range.minimum : Math.floor(range.minimum);
  return { base: Number.isFinite(base) ? base : 0, unit: extent > 0 && Number.isFinite(extent) ? extent : 1, noData };
}

// Complex samples are counted from 0; only what a 32-bit real cannot hold is brought into its range.
function unitOf({ minimum, maximum }: Range): number {
  const most = Math.max(Math.abs(minimum), Math.abs(maximum));
  return most > 1e18 || (most > 0 && most < 1e-18) ? most : 1;
}

const LARGE = 3e38; // which a 32-bit real can still hold

/** Converts samples, band by band of `conversions`, pixel by pixel; no data becomes not-a-number. */
export function convert(type: PixelType, data: SampleArray, conversions: readonly Conversion[]): Float32Array {
  if (type === "UInt64" || type === "Int64") return convertWide(type, data, conversions);
  const samples = data as Float64Array;
  const parts = isComplex(type) ? 2 : 1;
  const count = conversions.length * parts;
  const out = new Float32Array(samples.length);
  conversions.forEach(({ base, unit, noData }, i) => {
    for (let at = i * parts; at < samples.length; at += count) {
      const missing = isNone(type, samples, at, noData);
      for (let part = 0; part < parts; ++part) {
        const value = ((samples[at + part] as number) - base) / unit;
        out[at + part] = missing || !Number.isFinite(value) ? NaN : Math.min(Math.max(value, -LARGE), LARGE);
      }
    }
  });
  return out;
}

// The two halves of a difference, so that no sample becomes an object.
function convertWide(type: PixelType, data: SampleArray, conversions: readonly Conversion[]): Float32Array {
  const halves = new Uint32Array(data.buffer as ArrayBuffer, data.byteOffset, data.length * 2);
  const high = type === "Int64" ? new Int32Array(halves.buffer, halves.byteOffset, halves.length) : halves;
  const out = new Float32Array(data.length);
  conversions.forEach(({ base, unit, noData }, i) => {
    const [baseHigh, baseLow] = [Math.floor(base / 2 ** 32), base - Math.floor(base / 2 ** 32) * 2 ** 32];
    const none = noData === undefined ? undefined : BigInt(noData);
    const fits = none !== undefined && (type === "Int64" ? BigInt.asIntN(64, none) : BigInt.asUintN(64, none)) === none;
    const noneHigh = fits ? Number(none >> 32n) : NaN;
    const noneLow = fits ? Number(BigInt.asUintN(32, none)) : NaN;
    for (let at = i; at < out.length; at += conversions.length) {
      const [low, top] = [halves[2 * at] as number, high[2 * at + 1] as number];
      const missing = top === noneHigh && low === noneLow;
      out[at] = missing ? NaN : ((top - baseHigh) * 2 ** 32 + (low - baseLow)) / unit;
    }
  });
  return out;
}
