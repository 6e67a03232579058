// What stands behind the tiles: statistics, histograms, palettes, and items of a sidecar.
import { FormatError } from "./errors.js";
import { readInteger, readReal, truncate, truncateUnsigned } from "./numbers.js";
import type { PixelType, PixelValue } from "./types.js";
import { parseDocument } from "./xml.js";

/** The statistics of a band over level 0. What the file does not tell is `undefined`. */
export interface Statistics {
  /** The band that the record names, which the raster need not have. */
  band: number;
  minimum?: PixelValue;
  maximum?: PixelValue;
  mean?: number;
  /** That of the population. */
  standardDeviation?: number;
  sum?: number;
  sumOfSquares?: number;
  rootMeanSquare?: number;
}

/** A histogram of a band at a level. */
export interface Histogram {
  band: number;
  level: number;
  source: "Native" | "Dynamic" | "ORVA" | undefined;
  /** The number of bins that the file tells. */
  binCount: number;
  /** The width of a bin, in pixel values. */
  binSize: number;
  /** The ends of the range. */
  minimum: PixelValue;
  maximum: PixelValue;
  /** `binCount` whole numbers, or none where the file lacks its list. */
  counts: Float64Array;
}

/** The records of a file, as they were when it was asked for them. */
export interface Metadata {
  /** Of a band, counted from 0; `undefined` if there are none. */
  statistics(band: number): Statistics | undefined;
  /** All of them, in the order of the file. */
  readonly histograms: readonly Histogram[];
  /** Red, green, blue and alpha of each colour of a band, from 0 to 255; `undefined` if it has no palette. */
  palette(band: number): Uint8Array | undefined;
  /** The items of a sidecar that the file keeps itself: an XML text with the root `PAMDataset`. */
  readonly sidecar: string | undefined;
  /** Why the file's document is not believed, and nothing is told; `undefined` if it is, or if there is none. */
  readonly fault: string | undefined;
}

// Bins that the histograms of one document may have beyond the entries of their lists, all together.
const SPARE_BINS = 1 << 20;
const SIDECAR_START = '?xml version="1.0" encoding="UTF-8" standalone="no" ?>\n<DATASET>\n\n  <SIDECAR>';
const SOURCES = ["Native", "Dynamic", "ORVA"] as const;
const STATISTICS = {
  RSTC_MEAN: "mean",
  RSTC_STANDARDDEVIATION: "standardDeviation",
  RSTC_SUM: "sum",
  RSTC_SUM2: "sumOfSquares",
  RSTC_RMS: "rootMeanSquare",
} as const;

const INTEGER_BITS: Partial<Record<PixelType, number>> = {
  Byte: 8,
  UInt16: 16,
  UInt32: 32,
  Char: -8,
  Int16: -16,
  Int32: -32,
};

function toPixel(type: PixelType, value: number): PixelValue {
  const bits = INTEGER_BITS[type];
  if (bits) return Number(bits > 0 ? BigInt.asUintN(bits, truncate(value)) : BigInt.asIntN(-bits, truncate(value)));
  if (type === "UInt64") return truncateUnsigned(value);
  if (type === "Int64") return truncate(value);
  return type === "Single" || type === "ComplexSingle" ? Math.fround(value) : value;
}

// The elements go by their names alone, wherever they stand, and each piece of a text is taken for a whole
// value, as the module takes it.
class Records {
  readonly statistics: Statistics[] = [];
  readonly histograms: Histogram[] = [];
  readonly palettes = new Map<number, Uint8Array>();
  root: string | undefined;
  items = "";
  private readonly stack: string[] = [];
  private elements = 0;
  private inItems = false;
  private stats: Statistics | undefined;
  private histogram: (Histogram & { list: number[] }) | undefined;
  private bins = 0; // of the list in hand; 0 before its first piece
  private entries = 0; // of all its pieces together
  private spareBins = SPARE_BINS;
  private colors: number[] = [];
  private paletteBand = 0;

  constructor(
    private readonly type: PixelType,
    private readonly hasItems: boolean,
  ) {}

  open(name: string): void {
    this.root ??= name;
    this.inItems = this.hasItems && ++this.elements === 2;
    this.stack.push(name);
    if (name === "BANDSTATISTICS") this.stats = { band: 0 };
    else if (name === "HISTOGRAMS") this.beginHistogram();
    else if (name === "PALETTE") this.colors = [];
  }

  close(name: string): void {
    this.inItems = false;
    this.stack.pop();
    if (name === "BANDSTATISTICS") {
      if (this.stats) this.statistics.push(this.stats);
      this.stats = undefined;
    } else if (name === "HISTOGRAMS") this.endHistogram();
    else if (name === "PALETTE") this.palettes.set(this.paletteBand, Uint8Array.from(this.colors));
  }

  text(piece: string): void {
    if (this.inItems) this.items += piece;
    const name = this.stack[this.stack.length - 1] as string;
    if (name.startsWith("RSTC_")) this.takeStatistics(name, piece);
    else if (name.startsWith("HIST_")) this.takeHistogram(name, piece);
    else if (name === "PALETTE_BAND") this.paletteBand = readInteger(piece);
    else if (name === "PALETTE_RGBA") this.takeColor(piece);
  }

  private takeStatistics(name: string, text: string): void {
    if (!this.stats) return;
    if (name === "RSTC_BAND") this.stats.band = readInteger(text);
    else if (name === "RSTC_MINIMUM") this.stats.minimum = toPixel(this.type, readReal(text));
    else if (name === "RSTC_MAXIMUM") this.stats.maximum = toPixel(this.type, readReal(text));
    else if (name in STATISTICS) this.stats[STATISTICS[name as keyof typeof STATISTICS]] = readReal(text);
  }

  private beginHistogram(): void {
    const zero = toPixel(this.type, 0);
    const counts = new Float64Array(0);
    const values = { source: undefined, binCount: 0, binSize: 0, minimum: zero, maximum: zero };
    this.histogram = { band: 0, level: 0, ...values, counts, list: [] };
    this.bins = this.entries = 0;
  }

  private takeHistogram(name: string, text: string): void {
    const { histogram } = this;
    if (!histogram) return;
    if (name === "HIST_BAND") histogram.band = readInteger(text);
    else if (name === "HIST_LEVEL") histogram.level = readInteger(text);
    else if (name === "HIST_SOURCE") histogram.source = SOURCES.find((word) => word === text);
    else if (name === "HIST_BINCOUNT") histogram.binCount = readInteger(text);
    else if (name === "HIST_BINSIZE") histogram.binSize = readReal(text);
    else if (name === "HIST_MIN") histogram.minimum = toPixel(this.type, readReal(text));
    else if (name === "HIST_MAX") histogram.maximum = toPixel(this.type, readReal(text));
    else if (name === "HIST_COUNTS" && histogram.binCount > 0) this.takeCounts(histogram, text);
  }

  private takeCounts({ binCount, list }: { binCount: number; list: number[] }, text: string): void {
    const parts = text.split("|");
    if (!this.bins) {
      this.bins = binCount;
      this.entries = 1;
    }
    this.entries += parts.length - 1;
    const end = Math.min(binCount, this.bins, parts.length);
    for (let i = 0; i < end; ++i) list[i] = Number(truncateUnsigned(readReal(parts[i] as string)));
  }

  private endHistogram(): void {
    if (!this.histogram) return;
    const { list, ...histogram } = this.histogram;
    const spare = Math.max(this.bins - this.entries, 0);
    if (spare <= this.spareBins) {
      this.spareBins -= spare;
      histogram.counts = new Float64Array(Math.max(this.bins, list.length));
      histogram.counts.set(list);
    }
    this.histograms.push(histogram);
    this.histogram = undefined;
  }

  private takeColor(text: string): void {
    const parts = text.split("|", 4);
    for (let i = 0; i < 4; ++i) this.colors.push(Number(BigInt.asUintN(8, truncate(readReal(parts[i] ?? "")))));
  }
}

/** Reads a metadata document; none, or one that is not believed, tells nothing. Does not throw. */
export function readMetadata(document: Uint8Array, type: PixelType): Metadata {
  const start = String.fromCharCode(...document.subarray(1, SIDECAR_START.length + 1));
  const records = new Records(type, start === SIDECAR_START);
  let fault: string | undefined;
  try {
    if (document[0] === 0x1a) throw new FormatError("a store did not end");
    if (document.length) parseDocument(document, records);
    if (document.length && records.root !== "DATASET") throw new FormatError("it has no root DATASET");
  } catch (error) {
    fault = `the metadata document is malformed: ${(error as Error).message}`;
  }
  return believed(fault === undefined ? records : new Records(type, false), fault);
}

// A host gets what stands at the place of the band if it is the band's own, and else the first of the band.
function believed({ statistics, histograms, palettes, items }: Records, fault: string | undefined): Metadata {
  return {
    statistics: (band) =>
      statistics[band]?.band === band ? statistics[band] : statistics.find((record) => record.band === band),
    histograms,
    palette: (band) => (palettes.get(band)?.length ? palettes.get(band) : undefined),
    sidecar: items || undefined,
    fault,
  };
}
