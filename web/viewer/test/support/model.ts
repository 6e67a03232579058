// What a picture has to be, told once more: straight from the samples that the reader gives, one pixel at a time.
import type { Pyramid, SampleArray } from "zmcraster-web";

/** Row by row from the top: red, green, blue, alpha; colours multiplied by alpha. */
export interface Picture {
  width: number;
  height: number;
  pixels: Uint8Array;
}

export interface ModelStyle {
  bands: number[];
  ranges: [minimum: number, maximum: number][];
  gamma?: number;
  /** 256 colours, or a palette of red, green, blue and alpha. */
  colors?: number[][];
  palette?: boolean;
  noData?: number | bigint;
  alpha?: number;
  part?: "magnitude" | "real" | "imaginary" | "phase";
}

type Sample = number | bigint | [number, number];

function isMissing(sample: Sample, noData: number | bigint | undefined): boolean {
  if (typeof sample === "bigint") return sample === noData;
  const parts = typeof sample === "number" ? [sample] : sample;
  return !parts.every(Number.isFinite) || (parts[0] === noData && (parts[1] ?? 0) === 0);
}

function valueOf(sample: Sample, part: ModelStyle["part"]): number | bigint {
  if (typeof sample !== "object") return sample;
  const [real, imaginary] = sample;
  if (part === "real") return real;
  if (part === "imaginary") return imaginary;
  return part === "phase" ? Math.atan2(imaginary, real) : Math.hypot(real, imaginary);
}

// Of 64 bits the difference is taken before anything is rounded.
function above(value: number | bigint, minimum: number): number {
  return typeof value === "bigint" && Number.isInteger(minimum)
    ? Number(value - BigInt(minimum))
    : Number(value) - minimum;
}

function entryOf(value: number | bigint, [minimum, maximum]: [number, number], gamma = 1): number {
  const t = maximum === minimum ? Number(above(value, maximum) >= 0) : above(value, minimum) / (maximum - minimum);
  return Math.floor(255 * Math.min(Math.max(t, 0), 1) ** (1 / gamma) + 0.5);
}

function colorOf(samples: Sample[], style: ModelStyle): [number, number, number, number] {
  const { bands, ranges, gamma, colors, palette, noData, part } = style;
  const missing = samples.map((sample) => isMissing(sample, noData));
  if (missing.slice(0, bands.length).every(Boolean)) return [0, 0, 0, 0];
  const value = (i: number): number | bigint => valueOf(samples[i] as Sample, part);
  if (palette) {
    const [red, green, blue, alpha] = (colors?.[Number(value(0))] ?? [0, 0, 0, 0]) as [number, number, number, number];
    return [(red * alpha) / 255, (green * alpha) / 255, (blue * alpha) / 255, alpha];
  }
  const entries = bands.map((_, i) => (missing[i] ? 0 : entryOf(value(i), ranges[i] as [number, number], gamma)));
  const [red, green, blue] =
    colors?.[entries[0] as number] ?? (bands.length === 1 ? Array(3).fill(entries[0]) : entries);
  return [red as number, green as number, blue as number, 255];
}

/**
 * A raster on a screen, its pixels of level 0 being `zoom` pixels of the screen, with the nearest sample in each. A
 * level is whole here, so this is for small rasters.
 */
export async function draw(
  pyramid: Pyramid,
  screen: { width: number; height: number },
  view: { x: number; y: number; zoom: number; level: number },
  style: ModelStyle,
): Promise<Picture> {
  const level = pyramid.level(view.level);
  const { width, height } = level;
  const bands = style.alpha === undefined ? style.bands : [...style.bands, style.alpha];
  const { data } = await pyramid.readWindow(level.level, { x: 0, y: 0, width, height }, { bands });
  const pixels = new Uint8Array(4 * screen.width * screen.height);
  const left = Math.round(screen.width / 2 - view.x * view.zoom);
  const top = Math.round(screen.height / 2 - view.y * view.zoom);
  const scale = view.zoom * level.scale;
  for (let row = 0; row < screen.height; ++row)
    for (let column = 0; column < screen.width; ++column) {
      const x = Math.floor((column + 0.5 - left) / scale);
      const y = Math.floor((row + 0.5 - top) / scale);
      if (x < 0 || y < 0 || x >= width || y >= height) continue;
      const samples = bands.map((_, i) => sampleAt(data, pyramid, (y * width + x) * bands.length + i));
      const color = colorOf(samples, style);
      const opacity = style.alpha === undefined ? 1 : Math.min(Math.max(Number(samples.at(-1)) / 255, 0), 1);
      pixels.set(
        color.map((part) => Math.round(part * opacity)),
        4 * (row * screen.width + column),
      );
    }
  return { ...screen, pixels };
}

function sampleAt(data: SampleArray, { header }: Pyramid, i: number): Sample {
  if (!header.pixelType.startsWith("Complex")) return data[i] as number | bigint;
  return [Number(data[2 * i]), Number(data[2 * i + 1])];
}
