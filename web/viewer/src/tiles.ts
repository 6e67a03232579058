// The tiles of one raster on the graphics processor: asked for as they come into view, let go of as they leave it,
// and kept within a bound, those used last first.
import { ChangedError } from "../../src/errors.js";
import type { Raster } from "./raster.js";
import { type Conversion, convert, conversionFor, type Format, formatOf } from "./samples.js";
import { isComplex, type Style } from "./style.js";

/** Some bands of a tile in one texture. */
export interface Tile {
  texture: WebGLTexture;
  width: number;
  height: number;
  bytes: number;
}

export interface TileAddress {
  level: number;
  x: number;
  y: number;
}

/** Where a band is found: in the texture of a group of bands, as one of its channels. */
export interface Channel {
  group: number;
  component: number;
}

/** Tiles of one picture: each takes a call, however small it is. */
export const MOST_TILES = 3000;

export class TileStore {
  readonly format: Format;
  /** Bytes that textures may take. */
  limit = 192 * 2 ** 20;
  private readonly kept = new Map<string, Tile>(); // in the order of use, the oldest first
  private readonly pending = new Map<string, AbortController>();
  private readonly failed = new Map<string, Error>();
  private bytes = 0;
  private readonly conversions = new Map<number, Conversion>();
  private readonly groups: number[][];
  private readonly groupSize: number;
  /** Whether nothing can be read of the file any more. */
  lost: Error | undefined;

  /** @param changed Is called when a tile has come, or could not be had. */
  constructor(
    private readonly gl: WebGL2RenderingContext,
    private readonly raster: Raster,
    private readonly changed: () => void,
  ) {
    const { bands, type, pyramid } = raster;
    this.format = formatOf(type);
    // Up to four bands of a tile that holds all are one texture; in the ordering Morton each lies by itself.
    this.groupSize = isComplex(type) || pyramid.header.tileOrdering === "Morton" ? 1 : 4;
    this.groups = Array.from({ length: Math.ceil(bands / this.groupSize) }, (_, group) =>
      Array.from({ length: this.groupSize }, (_, i) => group * this.groupSize + i).filter((band) => band < bands),
    );
  }

  channelOf(band: number): Channel {
    return { group: Math.floor(band / this.groupSize), component: band % this.groupSize };
  }

  conversion(band: number): Conversion {
    return this.conversions.get(band) ?? { base: 0, unit: 1, noData: undefined };
  }

  /** Bytes that a full tile takes with some groups of bands. */
  tileBytes(groups: readonly number[]): number {
    const pixels = this.raster.pyramid.header.tileSize ** 2;
    const channels = groups.reduce((sum, group) => sum + (this.groups[group] as number[]).length, 0);
    return pixels * channels * this.format.bytes * (isComplex(this.raster.type) ? 2 : 1);
  }

  /** Whether so many tiles fit at once. */
  fits(tiles: number, groups: readonly number[]): boolean {
    return tiles <= MOST_TILES && tiles * this.tileBytes(groups) <= this.limit;
  }

  /** Sees to it that samples which are converted suit a style; those that do not any more are read again. */
  suit(style: Style): void {
    if (!this.format.converted) return;
    const shown = style.alpha === undefined ? style.bands : [...style.bands, style.alpha];
    for (const band of shown) {
      const noData = this.raster.noData(band, style.noData);
      const range = style.ranges[band] ?? { minimum: 0, maximum: 1 };
      const plain = style.colors === "palette" || band === style.alpha;
      const now = this.conversions.get(band);
      const next = plain ? { base: 0, unit: 1, noData } : conversionFor(this.raster.type, range, noData, now);
      const { base, unit, noData: none } = this.conversion(band);
      this.conversions.set(band, next);
      // Bands that were not shown before may be in textures all the same, beside others.
      if (base !== next.base || unit !== next.unit || !Object.is(none, next.noData))
        this.drop(this.channelOf(band).group);
    }
  }

  private drop(group: number): void {
    const of = (key: string): boolean => key.endsWith(`:${group}`);
    for (const [key, tile] of this.kept) if (of(key)) this.remove(key, tile);
    for (const [key, abort] of this.pending) if (of(key)) this.leave(key, abort);
  }

  private leave(key: string, abort: AbortController): void {
    this.pending.delete(key);
    abort.abort();
  }

  private remove(key: string, { texture, bytes }: Tile): void {
    this.gl.deleteTexture(texture);
    this.kept.delete(key);
    this.bytes -= bytes;
  }

  /** A tile that is here. */
  get({ level, x, y }: TileAddress, group: number): Tile | undefined {
    return this.kept.get(`${level}/${x}/${y}:${group}`);
  }

  /** Asks for those tiles that are not here, in that order, and leaves all others that are on their way. */
  want(tiles: readonly TileAddress[], groups: readonly number[]): void {
    const wanted = new Map<string, [TileAddress, number]>();
    for (const tile of tiles)
      for (const group of groups) wanted.set(`${tile.level}/${tile.x}/${tile.y}:${group}`, [tile, group]);
    for (const [key, abort] of this.pending) if (!wanted.has(key)) this.leave(key, abort);
    if (this.lost) return;
    // The first ones are the last to be let go of.
    for (const key of [...wanted.keys()].reverse()) this.use(key);
    for (const [key, [tile, group]] of wanted)
      if (!this.kept.has(key) && !this.pending.has(key) && !this.failed.has(key)) void this.load(key, tile, group);
  }

  private use(key: string): void {
    const tile = this.kept.get(key);
    if (!tile) return;
    this.kept.delete(key);
    this.kept.set(key, tile);
  }

  private async load(key: string, { level, x, y }: TileAddress, group: number): Promise<void> {
    const abort = new AbortController();
    this.pending.set(key, abort);
    const bands = this.groups[group] as number[];
    try {
      const { data, width, height } = await this.raster.pyramid.readTile(level, x, y, { bands, signal: abort.signal });
      if (abort.signal.aborted) return;
      this.keep(key, this.upload(data as ArrayBufferView as Float32Array, width, height, bands));
    } catch (error) {
      if (abort.signal.aborted) return;
      if (error instanceof ChangedError) this.lost = error;
      this.failed.set(key, error as Error);
    } finally {
      if (this.pending.get(key) === abort) this.pending.delete(key);
    }
    this.changed();
  }

  private upload(data: Float32Array, width: number, height: number, bands: readonly number[]): Tile {
    const { gl, format, raster } = this;
    const channels = isComplex(raster.type) ? 2 : bands.length;
    const [internal, order] = format.layouts[channels - 1] as readonly [GLenum, GLenum];
    const samples = format.converted
      ? convert(
          raster.type,
          data,
          bands.map((band) => this.conversion(band)),
        )
      : data;
    const texture = gl.createTexture();
    gl.bindTexture(gl.TEXTURE_2D, texture);
    gl.pixelStorei(gl.UNPACK_ALIGNMENT, 1);
    gl.texImage2D(gl.TEXTURE_2D, 0, internal, width, height, 0, order, format.type, samples);
    for (const filter of [gl.TEXTURE_MIN_FILTER, gl.TEXTURE_MAG_FILTER])
      gl.texParameteri(gl.TEXTURE_2D, filter, gl.NEAREST);
    return { texture, width, height, bytes: width * height * channels * format.bytes };
  }

  private keep(key: string, tile: Tile): void {
    this.kept.set(key, tile);
    this.bytes += tile.bytes;
    for (const [oldest, each] of this.kept) {
      if (this.bytes <= this.limit && this.kept.size <= 2 * MOST_TILES) break;
      this.remove(oldest, each);
    }
  }

  /** What is known of the tiles: how many are on their way, and why some could not be had. */
  get state(): { pending: number; failed: number; bytes: number; reason: Error | undefined } {
    const reason = this.lost ?? this.failed.values().next().value;
    return { pending: this.pending.size, failed: this.failed.size, bytes: this.bytes, reason };
  }

  /** Lets those be asked for again that could not be had. */
  retry(): void {
    this.failed.clear();
    this.changed();
  }

  /** Forgets all tiles; with `alive` false their textures are gone already. */
  clear(alive = true): void {
    for (const abort of this.pending.values()) abort.abort();
    this.pending.clear();
    if (alive) for (const { texture } of this.kept.values()) this.gl.deleteTexture(texture);
    this.kept.clear();
    this.failed.clear();
    this.bytes = 0;
  }
}
