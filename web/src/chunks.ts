// Runs of bytes (chunks) of one file: asked for once however many want them, in few requests, and kept for a
// while. Chunks that are asked for in the same turn of the event loop and lie near each other are one request.
import { ChangedError, SourceError } from "./errors.js";
import type { Source } from "./source.js";

/** How requests are made and what is kept of their answers. */
export interface ChunkOptions {
  /** Bytes of tiles that are kept, those used last first; 64 MiB by default, 0 for none. */
  cacheBytes?: number;
  /** Requests at one time; 6 by default. */
  maxRequests?: number;
  /** Bytes between two tiles that are read along with them rather than asking twice; 16 KiB by default. */
  maxGap?: number;
  /** Bytes up to which tiles are put into one request; 4 MiB by default. One tile is always one request. */
  maxRequestBytes?: number;
}

interface Chunk {
  offset: number;
  length: number;
  key: string;
  waiters: number;
  settled: boolean;
  request: Request | undefined; // undefined: of the next requests
  promise: Promise<Uint8Array>;
  resolve(bytes: Uint8Array): void;
  reject(reason: unknown): void;
}

interface Request {
  chunks: Chunk[];
  waiters: number; // of all its chunks
  end: number;
  abort: AbortController | undefined; // once it is under way
}

export class ChunkReader {
  private readonly cache = new Map<string, Uint8Array>(); // in the order of use, the oldest first
  private cached = 0;
  private readonly pending = new Map<string, Chunk>();
  private readonly fresh = new Set<Chunk>();
  private readonly queue = new Set<Request>();
  private running = 0;
  private broken: unknown;

  /**
   * @param head The first bytes of the file, which are not asked for again.
   * @param size Bytes of the file; Infinity if nobody knows. What lies behind its end reads as zeros.
   */
  constructor(
    private readonly source: Source,
    private readonly head: Uint8Array,
    readonly size: number,
    private readonly options: ChunkOptions,
  ) {}

  /** Bytes that are kept of tiles at the moment. */
  get cachedBytes(): number {
    return this.cached;
  }

  /** What ends all reads from now on. */
  fail(reason: unknown): void {
    this.broken ??= reason;
    this.cache.clear();
    this.cached = 0;
    const chunks = [...this.pending.values()];
    for (const chunk of chunks) chunk.reject(this.broken);
    for (const { request } of chunks) request?.abort?.abort(reason);
    this.queue.clear();
    this.fresh.clear();
  }

  /**
   * The bytes of a run, zeros where the file has ended. They are shared: nobody changes them. With `keep` false
   * they are not kept for others. Rejects with the signal's reason as soon as it aborts; the request itself ends
   * when all who wait for it have gone.
   */
  async read(offset: number, length: number, signal?: AbortSignal, keep = true): Promise<Uint8Array> {
    signal?.throwIfAborted();
    if (this.broken) throw this.broken;
    if (length === 0 || offset >= this.size) return new Uint8Array(length);
    if (offset + Math.min(length, this.size - offset) <= this.head.length)
      return padded(this.head.slice(offset, offset + length), length);
    const key = `${offset}:${length}`;
    const known = this.cache.get(key);
    if (known) {
      this.cache.delete(key);
      this.cache.set(key, known);
      return known;
    }
    const chunk = this.pending.get(key) ?? this.begin(key, offset, length, keep);
    return this.wait(chunk, signal);
  }

  private begin(key: string, offset: number, length: number, keep: boolean): Chunk {
    const chunk = { key, offset, length, waiters: 0, settled: false, request: undefined } as unknown as Chunk;
    chunk.promise = new Promise((resolve, reject) => {
      chunk.resolve = (bytes) => {
        this.settle(chunk);
        if (keep) this.keep(key, bytes);
        resolve(bytes);
      };
      chunk.reject = (reason) => {
        this.settle(chunk);
        reject(reason);
      };
    });
    // Where all have gone, nobody hears of a failure.
    chunk.promise.catch(() => undefined);
    this.pending.set(key, chunk);
    if (this.fresh.add(chunk).size === 1) queueMicrotask(() => this.send());
    return chunk;
  }

  private settle(chunk: Chunk): void {
    chunk.settled = true;
    if (this.pending.get(chunk.key) === chunk) this.pending.delete(chunk.key);
  }

  private wait(chunk: Chunk, signal: AbortSignal | undefined): Promise<Uint8Array> {
    chunk.waiters++;
    if (chunk.request) chunk.request.waiters++;
    return new Promise((resolve, reject) => {
      const leave = (): void => {
        forget();
        chunk.waiters--;
        if (chunk.request) chunk.request.waiters--;
        if ((chunk.request ?? chunk).waiters === 0 && !chunk.settled) this.abandon(chunk);
      };
      const stop = (): void => {
        leave();
        reject(signal?.reason);
      };
      const forget = onAbort(signal, stop);
      chunk.promise.then(
        (bytes) => {
          if (signal?.aborted) return;
          leave();
          resolve(bytes);
        },
        (reason: unknown) => {
          if (signal?.aborted) return;
          leave();
          reject(reason);
        },
      );
    });
  }

  // Nobody wants it any more, nor what would come along with it.
  private abandon(chunk: Chunk): void {
    const { request } = chunk;
    for (const each of request?.chunks ?? [chunk]) this.settle(each);
    this.fresh.delete(chunk);
    if (!request) return;
    this.queue.delete(request);
    request.abort?.abort();
  }

  // Puts all new chunks into requests.
  private send(): void {
    const { maxGap = 2 ** 14, maxRequestBytes = 2 ** 22 } = this.options;
    const chunks = [...this.fresh].sort((a, b) => a.offset - b.offset);
    this.fresh.clear();
    let request: Request | undefined;
    for (const chunk of chunks) {
      const end = chunk.offset + chunk.length;
      const start = request?.chunks[0]?.offset ?? 0;
      if (!request || chunk.offset - request.end > maxGap || Math.max(end, request.end) - start > maxRequestBytes) {
        request = { chunks: [], waiters: 0, end: 0, abort: undefined };
        this.queue.add(request);
      }
      chunk.request = request;
      request.chunks.push(chunk);
      request.waiters += chunk.waiters;
      request.end = Math.max(request.end, end);
    }
    this.start();
  }

  private start(): void {
    for (const request of this.queue) {
      if (this.running >= (this.options.maxRequests ?? 6)) return;
      this.queue.delete(request);
      this.running++;
      void this.run(request).finally(() => {
        this.running--;
        this.start();
      });
    }
  }

  private async run(request: Request): Promise<void> {
    const offset = (request.chunks[0] as Chunk).offset;
    const length = Math.min(request.end, this.size) - offset;
    const { signal } = (request.abort = new AbortController());
    try {
      const bytes = asBytes(await this.source.read(offset, length, signal));
      if (bytes.length > length || (bytes.length < length && this.size !== Infinity))
        throw new SourceError(`the source gave ${bytes.length} bytes in place of ${length}`);
      const alone = request.chunks.length === 1;
      for (const { resolve, ...chunk } of request.chunks) {
        const from = chunk.offset - offset;
        // A part is copied, or it would hold the memory of the whole.
        const part = alone ? bytes : bytes.slice(from, from + chunk.length);
        resolve(padded(part, chunk.length));
      }
    } catch (error) {
      if (error instanceof ChangedError) this.fail(error);
      for (const chunk of request.chunks) chunk.reject(error);
    }
  }

  private keep(key: string, bytes: Uint8Array): void {
    const { cacheBytes = 2 ** 26 } = this.options;
    if (bytes.length > cacheBytes || this.broken) return;
    this.cache.set(key, bytes);
    this.cached += bytes.length;
    for (const [oldest, { length }] of this.cache) {
      if (this.cached <= cacheBytes) break;
      this.cache.delete(oldest);
      this.cached -= length;
    }
  }
}

const stops = new WeakMap<AbortSignal, Set<() => void>>();

/**
 * Calls `stop` when `signal` aborts, unless the answer has been called before. A signal may serve thousands of reads,
 * so it hears of one of them alone.
 */
export function onAbort(signal: AbortSignal | undefined, stop: () => void): () => void {
  if (!signal) return () => undefined;
  const known = stops.get(signal);
  const all = known ?? new Set();
  if (!known) {
    stops.set(signal, all);
    signal.addEventListener("abort", () => [...all].forEach((each) => each()), { once: true });
  }
  all.add(stop);
  return () => all.delete(stop);
}

/** Bytes as an array of its own alignment, so that samples of any size can be looked at in place. */
export function asBytes(bytes: Uint8Array | ArrayBuffer): Uint8Array {
  if (!(bytes instanceof Uint8Array)) return new Uint8Array(bytes);
  return bytes.byteOffset % 16 ? bytes.slice() : bytes;
}

function padded(bytes: Uint8Array, length: number): Uint8Array {
  if (bytes.length >= length) return bytes;
  const longer = new Uint8Array(length);
  longer.set(bytes);
  return longer;
}
