/**
 * Pyramids in OpenSeadragon, as pictures of 8 bits: samples are stretched over a range, or looked up in the
 * palette of their band.
 *
 * @packageDocumentation
 */
import type OpenSeadragon from "openseadragon";

import type { Level, Pixels, Pyramid } from "./index.js";

/** How samples become colours. */
export interface PictureOptions {
  /** One band, shown in grey or, of integers, by its palette, or three: red, green and blue. The first three by default, or the first. */
  bands?: readonly number[];
  /** The values that are black and full; by default 0 and 255 for `Byte`, else the ends that the file's statistics tell. */
  range?: readonly [number, number];
  /** Pixels of which all bands have this value are transparent. */
  noData?: number;
}

/** What a picture is made by. */
export interface Look {
  bands: readonly number[];
  ranges: readonly (readonly [number, number])[];
  palette: Uint8Array | undefined;
  noData: number | undefined;
}

type Namespace = typeof OpenSeadragon;
let sources = 0; // tiles of all of a page share one cache

/**
 * A tile source for a viewer. `namespace` is what the package `openseadragon` exports.
 *
 * @throws RangeError for a pyramid without pixels, a band that it does not have, other than one or three bands, or
 * where neither the caller nor the file tells a range
 */
export async function createTileSource(
  namespace: Namespace,
  pyramid: Pyramid,
  options: PictureOptions = {},
): Promise<OpenSeadragon.TileSource> {
  const look = await lookOf(pyramid, options);
  // From the coarsest on, as viewers count.
  const levels = pyramid.levels.filter(({ width, height }) => width && height).reverse();
  const finest = levels[levels.length - 1];
  if (!finest) throw new RangeError("the pyramid has no pixels to show");
  const { tileSize } = pyramid.header;
  const { width, height } = finest;
  const prefix = `zmcraster:${++sources}/`;

  class PyramidTileSource extends namespace.TileSource {
    override getNumTiles(level: number): OpenSeadragon.Point {
      const { tilesAcross, tilesDown } = levels[level] as Level;
      return new namespace.Point(tilesAcross, tilesDown);
    }

    // By the pixels that a level has: the viewer would round the other way.
    override getTileBounds(level: number, x: number, y: number, isSource?: boolean): OpenSeadragon.Rect {
      const of = levels[level] as Level;
      const [left, top] = [x * tileSize, y * tileSize];
      const [across, down] = [Math.min(tileSize, of.width - left), Math.min(tileSize, of.height - top)];
      if (isSource) return new namespace.Rect(0, 0, across, down);
      const scale = of.scale / finest!.scale / width;
      return new namespace.Rect(left * scale, top * scale, across * scale, down * scale);
    }

    override getTileUrl(level: number, x: number, y: number): string {
      return `${prefix}${level}/${x}_${y}`;
    }

    override hasTransparency(): boolean {
      return true;
    }

    override downloadTileStart(job: OpenSeadragon.ImageJob): void {
      const abort = new AbortController();
      (job as { userData?: unknown }).userData = abort;
      const [level, x, y] = job.src.slice(prefix.length).split(/[/_]/).map(Number) as [number, number, number];
      pyramid
        .readTile((levels[level] as Level).level, x, y, { bands: look.bands, signal: abort.signal })
        .then((pixels) => job.finish(draw(pixels, look), null as never, "context2d"))
        .catch((error: Error) => abort.signal.aborted || job.fail(error.message, null as never));
    }

    override downloadTileAbort(job: OpenSeadragon.ImageJob): void {
      (job as unknown as { userData: AbortController }).userData.abort();
    }
  }
  return new PyramidTileSource({ width, height, tileSize, minLevel: 0, maxLevel: levels.length - 1 });
}

// Reals are values and no places in a palette, even if the file archives colours.
const INDICES: readonly string[] = ["Byte", "Char", "UInt16", "Int16", "UInt32", "Int32", "UInt64", "Int64"];

/** What the options come to for a pyramid. */
export async function lookOf(pyramid: Pyramid, options: PictureOptions): Promise<Look> {
  const { bands: count, pixelType } = pyramid.header;
  const bands = options.bands ?? (count >= 3 ? [0, 1, 2] : [0]);
  const wrong = bands.find((band) => !(Number.isInteger(band) && band >= 0 && band < count));
  if (wrong !== undefined) throw new RangeError(`the file has no band ${wrong}`);
  if (bands.length !== 1 && bands.length !== 3) throw new RangeError("a picture has one band or three");
  const { range, noData } = options;
  const metadata = range && bands.length > 1 ? undefined : await pyramid.metadata();
  const ranges = bands.map((band): readonly [number, number] => {
    if (range) return range;
    if (pixelType === "Byte") return [0, 255];
    const { minimum, maximum } = metadata?.statistics(band) ?? {};
    if (minimum === undefined || maximum === undefined)
      throw new RangeError(`the file tells no range of the values of band ${band}: one has to be given`);
    return [Number(minimum), Number(maximum)];
  });
  const isIndexed = bands.length === 1 && !range && INDICES.includes(pixelType);
  const palette = isIndexed ? metadata?.palette(bands[0] as number) : undefined;
  return { bands, ranges, palette, noData };
}

/** The picture of a tile: red, green, blue and alpha of each pixel, row by row. */
export function toRgba({ data, width, height, pixelType }: Pixels, look: Look): Uint8ClampedArray<ArrayBuffer> {
  const out = new Uint8ClampedArray(width * height * 4);
  const isComplex = pixelType.startsWith("Complex");
  const count = look.bands.length;
  const value = (at: number): number =>
    isComplex ? Math.hypot(Number(data[2 * at]), Number(data[2 * at + 1])) : Number(data[at]);
  for (let pixel = 0; pixel < width * height; ++pixel) {
    const [to, from] = [pixel * 4, pixel * count];
    if (isEmpty(value, from, count, look.noData)) continue;
    if (look.palette) {
      out.set(look.palette.subarray(value(from) * 4, value(from) * 4 + 4), to);
      continue;
    }
    for (let i = 0; i < 3; ++i) {
      const band = Math.min(i, count - 1);
      const [low, high] = look.ranges[band] as readonly [number, number];
      out[to + i] = high > low ? ((value(from + band) - low) / (high - low)) * 255 : 0;
    }
    out[to + 3] = 255;
  }
  return out;
}

function isEmpty(value: (at: number) => number, from: number, count: number, noData: number | undefined): boolean {
  if (noData === undefined) return false;
  for (let i = 0; i < count; ++i) {
    const sample = value(from + i);
    if (sample !== noData && !(Number.isNaN(sample) && Number.isNaN(noData))) return false;
  }
  return true;
}

function draw(pixels: Pixels, look: Look): CanvasRenderingContext2D {
  const canvas = document.createElement("canvas");
  canvas.width = pixels.width;
  canvas.height = pixels.height;
  const context = canvas.getContext("2d") as CanvasRenderingContext2D;
  context.putImageData(new ImageData(toRgba(pixels, look), pixels.width, pixels.height), 0, 0);
  return context;
}
