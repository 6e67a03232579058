// How the values of a band are spread: what the file archives, or what its coarsest level shows.
import type { Histogram } from "../../src/metadata.js";
import type { PixelType, SampleArray } from "../../src/types.js";
import { isComplex, isNone, isReal, type Part, partOf, type Range } from "./style.js";

/** Counts in bins of one width. */
export interface Distribution extends Range {
  counts: Float64Array;
  /** The width of a bin, in values. */
  binSize: number;
  /** Whether values are whole numbers, which fill the interval up to the next one. */
  whole: boolean;
  /** Whether the file tells it; else it is that of the coarsest level. */
  archived: boolean;
  mean: number | undefined;
  deviation: number | undefined;
}

/** The value below which so many per cent of the samples lie: in bins of one whole number, that number. */
export function percentile({ counts, minimum, maximum, binSize, whole }: Distribution, percent: number): number {
  const target = (percent / 100) * counts.reduce((sum, count) => sum + count, 0);
  let before = 0;
  for (const [bin, count] of counts.entries()) {
    if (count > 0 && before + count >= target) {
      const rest = ((target - before) / count) * binSize;
      const inBin = whole ? Math.min(Math.floor(rest), binSize - 1) : rest;
      return Math.min(minimum + bin * binSize + inBin, maximum);
    }
    before += count;
  }
  return maximum;
}

/** An archived histogram, if it has counts. */
export function archived(histogram: Histogram, whole: boolean): Distribution | undefined {
  const { counts, binSize } = histogram;
  const [minimum, maximum] = [Number(histogram.minimum), Number(histogram.maximum)];
  if (!counts.some((count) => count > 0) || !(binSize > 0) || !Number.isFinite(maximum - minimum)) return undefined;
  return { counts, binSize, minimum, maximum, whole, archived: true, mean: undefined, deviation: undefined };
}

const BINS = 256;

/** The distribution of some samples, without those that are not numbers or no data. */
export function sampled(
  type: PixelType,
  data: SampleArray,
  part: Part,
  noData: number | bigint | undefined,
): Distribution {
  const values: number[] = [];
  const complex = isComplex(type);
  for (let i = 0; i < data.length; i += complex ? 2 : 1) {
    if (isNone(type, data, i, noData)) continue;
    const value = complex ? partOf(part, Number(data[i]), Number(data[i + 1])) : Number(data[i]);
    if (Number.isFinite(value)) values.push(value);
  }
  return spread(values, !isReal(type));
}

function spread(values: number[], whole: boolean): Distribution {
  const minimum = values.reduce((least, value) => Math.min(least, value), Infinity);
  const maximum = values.reduce((most, value) => Math.max(most, value), -Infinity);
  const empty = { counts: new Float64Array(1), binSize: 1, mean: undefined, deviation: undefined };
  if (!values.length) return { ...empty, minimum: 0, maximum: 1, whole, archived: false };
  const extent = maximum - minimum + (whole ? 1 : 0);
  const bins = whole ? Math.min(BINS, extent) : BINS;
  const binSize = extent / bins || 1 / bins;
  const counts = new Float64Array(bins);
  let [sum, squares] = [0, 0];
  for (const value of values) {
    const bin = Math.min(Math.floor((value - minimum) / binSize), bins - 1);
    counts[bin] = (counts[bin] as number) + 1;
    sum += value;
    squares += (value - minimum) ** 2;
  }
  const mean = sum / values.length;
  const deviation = Math.sqrt(Math.max(squares / values.length - (mean - minimum) ** 2, 0));
  return { counts, binSize, minimum, maximum, whole, archived: false, mean, deviation };
}
