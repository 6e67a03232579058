// How samples look: which bands, the stretch, gamma, colours. The formulas are those of the program's own renderer.
import type { PixelType, SampleArray } from "../../src/types.js";

export type Part = "magnitude" | "real" | "imaginary" | "phase";
export const PARTS: readonly Part[] = ["magnitude", "real", "imaginary", "phase"];

export interface Range {
  minimum: number;
  maximum: number;
}

export interface Style {
  /** One band, or three for red, green and blue. */
  bands: number[];
  /** The band that tells how opaque a pixel is. */
  alpha: number | undefined;
  /** The stretch of each band that has been looked at. */
  ranges: Record<number, Range>;
  gamma: number;
  /** Of one band: the name of a colour map, with `-` before it reversed, or `palette` for that of the file. */
  colors: string;
  /** `file`: what the file says; `none`; or the text of a value. */
  noData: string;
  /** What is shown of complex samples. */
  part: Part;
}

/** The place of a value in its stretch, after gamma: from 0 to 1. */
export function place(value: number, { minimum, maximum }: Range, gamma: number): number {
  const inside = maximum === minimum ? Number(value >= maximum) : (value - minimum) / (maximum - minimum);
  return Math.min(Math.max(inside, 0), 1) ** (1 / gamma);
}

/** The step of 255 that is shown, which is also the entry of a colour map. */
export const step = (value: number, range: Range, gamma: number): number =>
  Math.floor(255 * place(value, range, gamma) + 0.5);

export const isComplex = (type: PixelType): boolean => type.startsWith("Complex");
export const isWide = (type: PixelType): boolean => type === "UInt64" || type === "Int64";
export const isReal = (type: PixelType): boolean => type === "Single" || type === "Double" || isComplex(type);

/** Whether the sample that begins there is the one for no data, which complex samples have with no imaginary part. */
export function isNone(type: PixelType, data: SampleArray, at: number, noData: number | bigint | undefined): boolean {
  return noData !== undefined && data[at] === noData && (!isComplex(type) || data[at + 1] === 0);
}

/** What is shown of a complex sample. */
export function partOf(part: Part, real: number, imaginary: number): number {
  if (part === "real") return real;
  if (part === "imaginary") return imaginary;
  return part === "phase" ? Math.atan2(imaginary, real) : Math.hypot(real, imaginary);
}

/** The first and the last value of a type; the samples of real types go beyond that. */
export function rangeOfType(type: PixelType): Range {
  const bits = { Byte: 8, UInt16: 16, UInt32: 32, UInt64: 64, Char: -8, Int16: -16, Int32: -32, Int64: -64 };
  const of = bits[type as keyof typeof bits];
  if (of === undefined) return { minimum: 0, maximum: 1 };
  if (of > 0) return { minimum: 0, maximum: 2 ** of - 1 };
  return { minimum: -(2 ** (-of - 1)), maximum: 2 ** (-of - 1) - 1 };
}
