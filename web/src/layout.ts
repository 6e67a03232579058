// Where the tiles lie: arithmetic on a header, without a table. The formulas are the file format.
import { type Header, extentAt, tileDataBytes, tilesOver } from "./header.js";
import { TYPES } from "./types.js";

/** One level of a pyramid: its size in its own pixels, and its grid of tiles. */
export interface Level {
  /** The number of the level; 0 is the finest that there can be. */
  readonly level: number;
  /** Columns and rows. A level has half of those of the one before, rounded down, and may have none. */
  readonly width: number;
  readonly height: number;
  /** Tiles in a row of the grid, and in a column. */
  readonly tilesAcross: number;
  readonly tilesDown: number;
  /** How many pixels of level 0 a pixel is wide and high: 2 to the power of `level`, whatever the sizes are. */
  readonly scale: number;
}

/** Columns `x` to `x + width`, rows `y` to `y + height`, the ends not included, in pixels of a level. */
export interface Rectangle {
  x: number;
  y: number;
  width: number;
  height: number;
}

/** A run of bytes that is read as a whole: a tile, or in the ordering Morton one band of it. */
export interface Place {
  offset: number; // from the start of the file; -1: the file has no place for it
  length: number;
}

interface Tile {
  x: number;
  y: number;
}

export class Layout {
  readonly levels: readonly Level[];
  readonly tileDataEnd: number;
  readonly planar: boolean;
  readonly sampleBytes: number;
  private readonly woven: WovenPlaces | undefined;

  constructor(
    readonly header: Header,
    readonly tileDataStart: number,
  ) {
    const levels: Level[] = [];
    for (let level = header.levelMin; level <= header.levelMax; ++level) levels.push(levelOf(header, level));
    this.levels = levels;
    this.sampleBytes = TYPES[header.pixelType].bytes;
    this.planar = header.tileOrdering === "Morton";
    this.tileDataEnd = tileDataStart + tileDataBytes(header);
    if (this.planar) this.woven = new WovenPlaces(header, this.sampleBytes, tileDataStart);
  }

  /** The pixels of a tile, which the grid of the level has. */
  tile(level: Level, column: number, row: number): Rectangle {
    const side = this.header.tileSize;
    const [x, y] = [column * side, row * side];
    return { x, y, width: Math.min(side, level.width - x), height: Math.min(side, level.height - y) };
  }

  /** The runs that a tile is made of: one, or in the ordering Morton one for each of `bands`. */
  places(level: Level, column: number, row: number, bands: readonly number[]): Place[] {
    const { width, height } = this.tile(level, column, row);
    const pixels = width * height;
    if (this.woven) {
      const first = this.woven.placeOf(level.level, column, row);
      const { bandBytes } = this.woven;
      const length = pixels * this.sampleBytes;
      return bands.map((band) => ({ offset: first < 0 ? -1 : first + band * bandBytes, length }));
    }
    const pixelBytes = this.sampleBytes * this.header.bands;
    const side = this.header.tileSize;
    const before = level.width * row * side + column * side * height;
    const start = this.tileDataStart + tileDataBytes(this.header, level.level);
    return [{ offset: start + before * pixelBytes, length: pixels * pixelBytes }];
  }
}

function levelOf(header: Header, level: number): Level {
  const [width, height] = [extentAt(header.width, level), extentAt(header.height, level)];
  const [tilesAcross, tilesDown] = [tilesOver(width, header.tileSize), tilesOver(height, header.tileSize)];
  return { level, width, height, tilesAcross, tilesDown, scale: 2 ** level };
}

const bitWidth = (value: number): number => 32 - Math.clz32(value);

/**
 * The places along the Morton curve as sums: what lies before a tile on the curve is whole quadrants of the
 * quadtree over the grid of level 0, and the tiles of a quadrant at a level have the product of their summed
 * widths and heights. Reduced tiles come one tile late: before a tile stand those of the blocks that end
 * before the tile before it. At most 17 steps down the tree for each of at most 12 levels.
 */
class WovenPlaces {
  /** From band to band. */
  readonly bandBytes: number;
  private readonly across: number;
  private readonly down: number;
  private readonly endLevel: number; // above it every tile shrinks to nothing
  private readonly depth: number; // of the quadtree

  constructor(
    private readonly header: Header,
    private readonly sampleBytes: number,
    private readonly start: number,
  ) {
    const { width, height, tileSize, levelMin, levelMax } = header;
    this.across = tilesOver(width, tileSize);
    this.down = tilesOver(height, tileSize);
    this.endLevel = Math.min(bitWidth(tileSize), levelMax + 1);
    this.depth = bitWidth(Math.max(this.across, this.down, 1) - 1);
    let bytes = 0;
    for (let level = levelMin; level < this.endLevel; ++level)
      bytes += this.bytes({ x: 0, y: 0 }, 2 ** this.depth, level);
    this.bandBytes = bytes;
  }

  /** Of a tile in band 0, from the start of the file; -1 if its level has no place. */
  placeOf(level: number, column: number, row: number): number {
    if (level < this.header.levelMin || level >= this.endLevel) return -1;
    const block = { x: column << level, y: row << level };
    return level === 0 ? this.placeOfTile(block) : this.placeOfBlock(block, level);
  }

  private has(tile: Tile): boolean {
    return tile.x < this.across && tile.y < this.down;
  }

  // The last tile, on the curve too, of a square or of what the grid has of it.
  private lastOf(x: number, y: number, side: number): Tile {
    return { x: Math.min(x + side, this.across) - 1, y: Math.min(y + side, this.down) - 1 };
  }

  private previous(tile: Tile): Tile | undefined {
    for (let level = 1; level <= this.depth; ++level) {
      const half = 2 ** (level - 1);
      const { x, y } = corner(tile, level);
      const [right, below] = [(tile.x & half) !== 0, (tile.y & half) !== 0];
      if (right && below) return this.lastOf(x, y + half, half);
      if (below && this.has({ x: x + half, y })) return this.lastOf(x + half, y, half);
      if (right || below) return this.lastOf(x, y, half);
    }
    return undefined;
  }

  // The first tile behind a block.
  private following(block: Tile, blockLevel: number): Tile | undefined {
    for (let level = blockLevel + 1; level <= this.depth; ++level) {
      const half = 2 ** (level - 1);
      const { x, y } = corner(block, level);
      const beside = { x: x + half, y: block.y & ~(half - 1) };
      if (!(block.x & half) && this.has(beside)) return beside;
      const under = { x, y: y + half };
      if (!(block.y & half) && this.has(under)) return under;
    }
    return undefined;
  }

  // What the level has of a square of tiles.
  private bytes(square: Tile, side: number, level: number): number {
    if (!this.has(square)) return 0;
    const { width, height } = this.header;
    const columns = this.reduced(square.x, Math.min(this.across - square.x, side), this.across, width, level);
    const rows = this.reduced(square.y, Math.min(this.down - square.y, side), this.down, height, level);
    return columns * rows * this.sampleBytes;
  }

  // Extent at a level of some tiles in a row. Each is shifted by itself, and the bits lost with it.
  private reduced(first: number, covered: number, tiles: number, extent: number, level: number): number {
    const { tileSize } = this.header;
    const whole = first + covered === tiles ? covered - 1 : covered;
    const last = extent - (tiles - 1) * tileSize;
    return whole * (tileSize >> level) + (whole !== covered ? last >> level : 0);
  }

  private blockBytes(tile: Tile, level: number): number {
    return this.bytes(corner(tile, level), 2 ** level, level);
  }

  // What the level has of the blocks before the one with that tile.
  private bytesBefore(tile: Tile, level: number): number {
    let bytes = 0;
    for (let above = this.depth; above > level; --above) {
      const half = 2 ** (above - 1);
      const { x, y } = corner(tile, above);
      const [right, below] = [(tile.x & half) !== 0, (tile.y & half) !== 0];
      if (right || below) bytes += this.bytes({ x, y }, half, level);
      if (below) bytes += this.bytes({ x: x + half, y }, half, level);
      if (right && below) bytes += this.bytes({ x, y: y + half }, half, level);
    }
    return bytes;
  }

  private get firstReduced(): number {
    return Math.max(this.header.levelMin, 1);
  }

  private placeOfTile(tile: Tile): number {
    let place = this.start;
    if (this.header.levelMin === 0) place += this.bytesBefore(tile, 0);
    const previous = this.previous(tile);
    if (previous)
      for (let level = this.firstReduced; level < this.endLevel; ++level) place += this.bytesBefore(previous, level);
    return place;
  }

  // Behind the tile that the curve comes to next stand the blocks that it has left, the smallest first;
  // behind the last of the grid, its own ones in between.
  private placeOfBlock(block: Tile, level: number): number {
    const last = this.lastOf(0, 0, 2 ** this.depth);
    const next = this.following(block, level) ?? last;
    const previous = this.previous(next);
    let place = this.placeOfTile(next);
    if (this.header.levelMin === 0) place += this.blockBytes(next, 0);
    for (let at = this.firstReduced; at <= level; ++at) {
      if (previous && !same(corner(previous, at), corner(next, at))) {
        if (at === level && same(corner(previous, at), block)) break;
        place += this.blockBytes(previous, at);
      }
      if (same(next, last) && at !== level) place += this.blockBytes(next, at);
    }
    return place;
  }
}

const corner = (tile: Tile, level: number): Tile => ({ x: (tile.x >> level) << level, y: (tile.y >> level) << level });
const same = (a: Tile, b: Tile): boolean => a.x === b.x && a.y === b.y;
