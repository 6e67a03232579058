// Pyramid: an open pyramid file, and the pixels of its levels.
import { asBytes, type ChunkOptions, ChunkReader, onAbort } from "./chunks.js";
import { FormatError, LimitError, PyramidError } from "./errors.js";
import { decodeFront, FRONT_BYTES, type Header, parseHeader } from "./header.js";
import { Layout, type Level, type Place, type Rectangle } from "./layout.js";
import { type Metadata, readMetadata } from "./metadata.js";
import { BlobSource, BufferSource, type HttpOptions, HttpSource, type Source } from "./source.js";
import { type PixelType, type SampleArray, type SampleArrays, TYPES } from "./types.js";

/** What can be told when a file is opened. The limits hold for files that claim more than their bytes can be worth. */
export interface OpenOptions extends HttpOptions, ChunkOptions {
  /** Ends the opening; reads have signals of their own. */
  signal?: AbortSignal;
  /** Bands that a file may have; 65536 by default. */
  maxBands?: number;
  /** Bytes of a header document; 4 MiB by default. */
  maxHeaderBytes?: number;
  /** Bytes of a metadata document that is read; 32 MiB by default, and 256 MiB at most. */
  maxDocumentBytes?: number;
  /** Bytes that one read may answer with, and those that it may ask the source for; 256 MiB by default. */
  maxReadBytes?: number;
}

/** What a read can be told. */
export interface ReadOptions {
  /** Bands from 0 in the order wanted, one may stand twice; all by default. */
  bands?: readonly number[];
  /** The order of the samples in the answer; `"pixel"` by default. */
  interleave?: "pixel" | "band";
  /** Rejects the read with its reason when it aborts. */
  signal?: AbortSignal;
}

/** Samples of a rectangle of a level. */
export interface Pixels<T extends SampleArray = SampleArray> {
  /** Where the rectangle lies, and its size, in pixels of the level. */
  readonly level: number;
  readonly x: number;
  readonly y: number;
  readonly width: number;
  readonly height: number;
  /** The bands, in the order of the samples. */
  readonly bands: readonly number[];
  /**
   * The sample of the `i`-th of n bands in column x and row y of the answer is number `(y * width + x) * n + i`
   * with `"pixel"`, and `(i * height + y) * width + x` with `"band"`. A complex sample has two elements of `data`.
   */
  readonly interleave: "pixel" | "band";
  readonly pixelType: PixelType;
  /** The samples, in memory of the caller's own. */
  readonly data: T;
  /** Whether some of them lie behind the end of an incomplete file, and are zeros for that. */
  readonly missing: boolean;
}

/** The first bytes of a file that are asked for: they hold the header of every usual file. */
const HEAD_BYTES = 16384;
const MAX_DOCUMENT_BYTES = 2 ** 28;
/** Tiles of one read, and bands of tiles where those are apart: each takes memory, however small it is. */
const MAX_RUNS = 65536;

function sourceOf(from: string | URL | Blob | ArrayBuffer | Uint8Array | Source, options: OpenOptions): Source {
  if (typeof from === "string" || from instanceof URL) return new HttpSource(from, options);
  if (from instanceof Blob) return new BlobSource(from);
  if (from instanceof ArrayBuffer) return new BufferSource(new Uint8Array(from));
  return from instanceof Uint8Array ? new BufferSource(from) : from;
}

// Up to `length` bytes, less only where the source ends.
async function readHead(source: Source, offset: number, length: number, signal?: AbortSignal): Promise<Uint8Array> {
  const bytes = asBytes(await source.read(offset, length, signal));
  return bytes.length > length ? bytes.subarray(0, length) : bytes;
}

/**
 * A pyramid file that is open for reading. All its members may be used at the same time; nothing that they answer
 * changes afterwards.
 *
 * Reads reject with a `RangeError` where the caller asks for what the file does not have, with a
 * {@link PyramidError} where the file or its source is at fault, and with the reason of a signal that aborts.
 */
export class Pyramid {
  /** What the header says. */
  readonly header: Header;
  /** The levels that the file has, the finest first. */
  readonly levels: readonly Level[];
  /** Bytes of the file when it was opened; `undefined` if the source does not tell. */
  readonly fileSize: number | undefined;
  /** Where the tiles begin and end in a complete file, in bytes from its start. */
  readonly tileDataStart: number;
  readonly tileDataEnd: number;
  /** Whether the file reaches to the end of its tiles, and has version 1.1 or later. */
  readonly complete: boolean;
  private records: Metadata | undefined;

  private constructor(
    private readonly source: Source,
    private readonly layout: Layout,
    private readonly chunks: ChunkReader,
    private readonly options: OpenOptions,
  ) {
    const { versionMajor: major, versionMinor: minor } = layout.header;
    const { size } = chunks;
    this.header = layout.header;
    this.levels = layout.levels;
    this.fileSize = size === Infinity ? undefined : size;
    this.tileDataStart = layout.tileDataStart;
    this.tileDataEnd = layout.tileDataEnd;
    this.complete = (major > 1 || (major === 1 && minor > 0)) && size >= layout.tileDataEnd;
  }

  /**
   * Opens a file: one request of 16 KiB, and another only if its header is longer.
   *
   * @param from A URL, a `Blob` or `File`, the bytes themselves, or any {@link Source}. Bytes are not copied, and
   * are not to change while the file is open.
   * @throws FormatError, LimitError, or what the source fails with
   */
  static async open(
    from: string | URL | Blob | ArrayBuffer | Uint8Array | Source,
    options: OpenOptions = {},
  ): Promise<Pyramid> {
    const { signal, maxHeaderBytes = 2 ** 22, maxBands = 65536 } = options;
    signal?.throwIfAborted();
    const source = sourceOf(from, options);
    let head = await readHead(source, 0, HEAD_BYTES, signal);
    const size = source.size ?? (head.length < HEAD_BYTES ? head.length : undefined);
    const start = decodeFront(head, size, maxHeaderBytes);
    if (start > head.length) {
      const rest = await readHead(source, head.length, start - head.length, signal);
      const whole = new Uint8Array(head.length + rest.length);
      whole.set(head);
      whole.set(rest, head.length);
      head = whole;
    }
    if (start > head.length) throw new FormatError("its header cannot be read");
    const header = parseHeader(head.subarray(FRONT_BYTES, start), maxBands);
    return new Pyramid(
      source,
      new Layout(header, start),
      new ChunkReader(source, head, size ?? Infinity, options),
      options,
    );
  }

  /** Bytes of tiles that are kept at the moment. */
  get cachedBytes(): number {
    return this.chunks.cachedBytes;
  }

  /** The level of a number. @throws RangeError if the file does not have it */
  level(number: number): Level {
    const level = this.levels[number - this.header.levelMin];
    if (!level) throw new RangeError(`the file has no level ${number}`);
    return level;
  }

  /**
   * The samples of a tile, counted from 0 in the grid of its level. Tiles of the last column and row are as small
   * as the level leaves them.
   */
  async readTile<T extends PixelType = PixelType>(
    level: number,
    x: number,
    y: number,
    options: ReadOptions = {},
  ): Promise<Pixels<SampleArrays[T]>> {
    const of = this.level(level);
    if (!(isCount(x) && isCount(y) && x < of.tilesAcross && y < of.tilesDown))
      throw new RangeError(`level ${level} has no tile ${x}, ${y}`);
    return this.read(of, this.layout.tile(of, x, y), options);
  }

  /**
   * The samples of a rectangle of a level, in pixels of the level. All tiles that it touches are read, as a whole;
   * those that lie near each other in the file come in one request.
   */
  async readWindow<T extends PixelType = PixelType>(
    level: number,
    window: Rectangle,
    options: ReadOptions = {},
  ): Promise<Pixels<SampleArrays[T]>> {
    const of = this.level(level);
    const { x, y, width, height } = window;
    const counts = [x, y, width, height].every(isCount) && width > 0 && height > 0;
    if (!counts || x + width > of.width || y + height > of.height || !of.tilesAcross || !of.tilesDown)
      throw new RangeError(`level ${level} does not have the window of ${width} x ${height} pixels at ${x}, ${y}`);
    return this.read(of, window, options);
  }

  /**
   * The records behind the tiles: one request, the first time. A document that is malformed tells nothing but its
   * fault.
   * @throws LimitError where it is longer than `maxDocumentBytes`
   */
  async metadata({ signal }: { signal?: AbortSignal } = {}): Promise<Metadata> {
    signal?.throwIfAborted();
    if (this.records) return this.records;
    const most = Math.min(this.options.maxDocumentBytes ?? 2 ** 25, MAX_DOCUMENT_BYTES);
    const { size } = this.chunks;
    const length = Math.max(size - this.tileDataEnd, 0);
    if (length > most && size !== Infinity)
      throw new LimitError(`its metadata document has ${length} bytes, beyond the limit of ${most}`);
    const bytes =
      size === Infinity
        ? await this.readTail(most, signal)
        : await this.chunks.read(this.tileDataEnd, length, signal, false);
    return (this.records ??= readMetadata(bytes, this.header.pixelType));
  }

  /** Ends all reads under way, forgets all tiles and lets go of the source. */
  async close(): Promise<void> {
    this.chunks.fail(new PyramidError("the pyramid was closed"));
    await this.source.close?.();
  }

  // Of a source that does not tell its size: what it has, if that is not more than allowed.
  private async readTail(most: number, signal?: AbortSignal): Promise<Uint8Array> {
    const bytes = await readHead(this.source, this.tileDataEnd, most + 1, signal);
    if (bytes.length > most) throw new LimitError(`its metadata document is beyond the limit of ${most} bytes`);
    return bytes;
  }

  private async read<T extends PixelType>(
    level: Level,
    window: Rectangle,
    options: ReadOptions,
  ): Promise<Pixels<SampleArrays[T]>> {
    const { pixelType, bands: all } = this.header;
    const bands = options.bands ? [...options.bands] : Array.from({ length: all }, (_, band) => band);
    const wrong = bands.find((band) => !(isCount(band) && band < all));
    if (wrong !== undefined) throw new RangeError(`the file has no band ${wrong}`);
    const { x, y, width, height } = window;
    const bytes = width * height * bands.length * this.layout.sampleBytes;
    this.demand(bytes, "the answer would have");
    const tiles = this.tilesOf(level, window, [...new Set(bands)]);
    const interleave = options.interleave ?? "pixel";
    const answer = { level: level.level, x, y, width, height, bands, interleave, pixelType };
    const target = new ArrayBuffer(bytes);
    // With the first part that fails, nobody waits for the others any more.
    const own = new AbortController();
    const { signal } = options;
    signal?.throwIfAborted();
    const forget = onAbort(signal, () => own.abort(signal?.reason));
    const copies = tiles.map(async ({ tile, runs, order }) => {
      const read = runs.map(({ offset, length }) => this.chunks.read(offset, length, own.signal));
      this.copy(await Promise.all(read), order, tile, target, answer);
    });
    try {
      await Promise.all(copies);
    } catch (error) {
      own.abort();
      throw error;
    } finally {
      forget();
    }
    signal?.throwIfAborted();
    const missing = tiles.some(({ runs }) => runs.some(({ offset, length }) => offset + length > this.chunks.size));
    return { ...answer, missing, data: new TYPES[pixelType].array(target) as SampleArrays[T] };
  }

  // The tiles that a rectangle touches, with the runs that hold them.
  private tilesOf(level: Level, { x, y, width, height }: Rectangle, order: number[]): TileRuns[] {
    const side = this.header.tileSize;
    const tiles: TileRuns[] = [];
    let bytes = 0;
    if (!order.length) return tiles;
    const over = (first: number, extent: number): number =>
      Math.floor((first + extent - 1) / side) - Math.floor(first / side) + 1;
    const count = over(x, width) * over(y, height) * (this.layout.planar ? order.length : 1);
    if (count > MAX_RUNS) throw new LimitError(`it would take ${count} tiles, beyond the limit of ${MAX_RUNS}`);
    for (let row = Math.floor(y / side); row * side < y + height; ++row)
      for (let column = Math.floor(x / side); column * side < x + width; ++column) {
        const runs = this.layout.places(level, column, row, order);
        for (const { offset, length } of runs) {
          if (offset < 0) throw new FormatError(`the file has no place for the tiles of level ${level.level}`);
          bytes += length;
        }
        this.demand(bytes, "the tiles have");
        tiles.push({ tile: this.layout.tile(level, column, row), runs, order });
      }
    return tiles;
  }

  private demand(bytes: number, what: string): void {
    const most = this.options.maxReadBytes ?? MAX_DOCUMENT_BYTES;
    if (bytes > most) throw new LimitError(`${what} ${bytes} bytes, beyond the limit of ${most}`);
  }

  // Copies what a tile has of the window, band by band, or as whole rows where the order is the same.
  private copy(
    read: Uint8Array[],
    order: number[],
    tile: Rectangle,
    target: ArrayBuffer,
    answer: Omit<Pixels, "data" | "missing">,
  ): void {
    const { bands, width, height, interleave } = answer;
    const all = this.header.bands;
    const left = Math.max(tile.x, answer.x);
    const top = Math.max(tile.y, answer.y);
    const columns = Math.min(tile.x + tile.width, answer.x + width) - left;
    const rows = Math.min(tile.y + tile.height, answer.y + height) - top;
    const [planar, perPixel] = [this.layout.planar, interleave === "pixel"];
    const step = planar ? 1 : all;
    const targetStep = perPixel ? bands.length : 1;
    const from = (top - tile.y) * tile.width + (left - tile.x);
    const to = (top - answer.y) * width + (left - answer.x);
    const whole = !planar && perPixel && bands.length === all && bands.every((band, i) => band === i);
    const { units, array } = UNITS[this.layout.sampleBytes] as Units;
    const out = new array(target);
    const list = whole ? [0] : bands;
    list.forEach((band, i) => {
      const bytes = (planar ? read[order.indexOf(band)] : read[0]) as Uint8Array;
      const samples = new array(bytes.buffer as ArrayBuffer, bytes.byteOffset, bytes.length / array.BYTES_PER_ELEMENT);
      const first = planar ? 0 : band;
      const targetFirst = perPixel ? i : i * width * height;
      for (let row = 0; row < rows; ++row) {
        let source = ((from + row * tile.width) * step + first) * units;
        let at = ((to + row * width) * targetStep + targetFirst) * units;
        if (whole || (step === 1 && targetStep === 1)) {
          out.set(samples.subarray(source, source + columns * (whole ? all : 1) * units), at);
          continue;
        }
        const [skip, targetSkip] = [(step - 1) * units, (targetStep - 1) * units];
        for (let column = 0; column < columns; ++column, source += skip, at += targetSkip)
          for (let unit = 0; unit < units; ++unit) out[at++] = samples[source++] as number;
      }
    });
  }
}

interface TileRuns {
  tile: Rectangle;
  runs: Place[];
  order: number[]; // the bands of the runs, where each has its own
}

interface Units {
  units: number;
  array: typeof Uint8Array | typeof Uint16Array | typeof Uint32Array;
}

// Samples are moved as whole numbers: in those of 64 bits, and in reals, engines may change bits or make objects.
const UNITS: Record<number, Units> = {
  1: { units: 1, array: Uint8Array },
  2: { units: 1, array: Uint16Array },
  4: { units: 1, array: Uint32Array },
  8: { units: 2, array: Uint32Array },
  16: { units: 4, array: Uint32Array },
};

const isCount = (value: number): boolean => Number.isInteger(value) && value >= 0;
