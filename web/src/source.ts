// Where the bytes come from.
import { ChangedError, HttpError, PyramidError, RangesError, SourceError } from "./errors.js";

/** Bytes by their position. Any object of this shape can be opened. */
export interface Source {
  /**
   * The number of all bytes, once it is known: after the first read at the latest. A source that never tells
   * is taken to end where a read is answered with fewer bytes than were asked for.
   */
  readonly size?: number | undefined;
  /**
   * Reads `length` bytes from `offset` on, both whole numbers, `length` above 0; fewer only at the end of the
   * data, none behind it. Several reads may run at once. Rejects if `signal` aborts, with its reason. What is
   * answered is the caller's, and does not change any more.
   */
  read(offset: number, length: number, signal?: AbortSignal): Promise<Uint8Array | ArrayBuffer>;
  /** Lets go of what the source holds; there are no reads afterwards. */
  close?(): unknown;
}

/** Bytes in memory. */
export class BufferSource implements Source {
  readonly size: number;

  constructor(private readonly bytes: Uint8Array) {
    this.size = bytes.length;
  }

  async read(offset: number, length: number): Promise<Uint8Array> {
    return this.bytes.slice(offset, offset + length);
  }
}

/** A `Blob`, or a `File` that a user has chosen. One that changes on the disk gives a {@link ChangedError}. */
export class BlobSource implements Source {
  readonly size: number;

  constructor(private readonly blob: Blob) {
    this.size = blob.size;
  }

  async read(offset: number, length: number): Promise<ArrayBuffer> {
    try {
      return await this.blob.slice(offset, offset + length).arrayBuffer();
    } catch (cause) {
      throw new ChangedError("the file changed, or cannot be read any more", { cause });
    }
  }
}

/** How a file is asked for over HTTP. */
export interface HttpOptions {
  /** What asks; `globalThis.fetch` by default. */
  fetch?: typeof fetch;
  /** Headers of every request, such as `Authorization`. */
  headers?: Record<string, string>;
  /** As for `fetch`; `same-origin` by default. */
  credentials?: RequestCredentials;
  /**
   * Whether requests say `If-Range`. By default they do unless the URL is of another origin than the page:
   * there a browser would ask the server for permission first, once for every URL. Without it a file that was
   * replaced is found out by what the answer tells of itself.
   */
  ifRange?: boolean;
  /** Tries after the first that fails for the network, for 408, 429 or 5xx, or is short; 2 by default. */
  retries?: number;
  /** Milliseconds before the second try, twice as many before each further one; 250 by default. */
  retryDelay?: number;
  /** Bytes of a file that is taken whole from a server without ranges; 64 MiB by default, 0 for none. */
  maxWholeBytes?: number;
}

interface Answer {
  start: number;
  total: number | undefined;
}

// "bytes 0-99/1234"; the total may be "*".
function parseContentRange(text: string | null): Answer | undefined {
  const match = /^\s*bytes\s+(\d+)-\d+\/(\d+|\*)\s*$/i.exec(text ?? "");
  return match ? { start: Number(match[1]), total: match[2] === "*" ? undefined : Number(match[2]) } : undefined;
}

const isFinal = (error: unknown): boolean =>
  error instanceof PyramidError &&
  !(error instanceof HttpError
    ? error.status >= 500 || [408, 429].includes(error.status)
    : error.constructor === SourceError);

/**
 * A file on a server that gives ranges. What the first answer tells of the file (`ETag`, `Last-Modified`, its
 * size) has to be told by every later one, or the file has changed.
 */
export class HttpSource implements Source {
  size: number | undefined;
  private whole: BufferSource | undefined; // from a server without ranges
  private etag: string | null = null;
  private modified: string | null = null;
  private opened = false;
  private readonly url: string;
  private readonly options: HttpOptions;

  constructor(url: string | URL, options: HttpOptions = {}) {
    this.url = String(url);
    this.options = options;
  }

  async read(offset: number, length: number, signal?: AbortSignal): Promise<Uint8Array | ArrayBuffer> {
    const { retries = 2, retryDelay = 250 } = this.options;
    for (let attempt = 0; ; ++attempt) {
      if (this.whole) return this.whole.read(offset, length);
      signal?.throwIfAborted();
      try {
        return await this.ask(offset, length, signal);
      } catch (error) {
        signal?.throwIfAborted();
        if (isFinal(error) || attempt >= retries) throw this.named(error);
        await pause(retryDelay * 2 ** attempt, signal);
      }
    }
  }

  private named(error: unknown): unknown {
    if (error instanceof PyramidError) return error;
    return new SourceError(`${this.url}: the network failed`, { cause: error });
  }

  private async ask(offset: number, length: number, signal?: AbortSignal): Promise<Uint8Array | ArrayBuffer> {
    const { fetch: ask = fetch, credentials = "same-origin" } = this.options;
    const headers: Record<string, string> = {
      ...this.options.headers,
      Range: `bytes=${offset}-${offset + length - 1}`,
    };
    const validator = this.validator();
    if (validator) headers["If-Range"] = validator;
    const response = await ask(this.url, { headers, credentials, ...(signal && { signal }) });
    if (response.status === 206) return this.takePart(response, offset, length);
    if (response.status === 200) return this.takeWhole(response, offset, length);
    this.drop(response);
    if (response.status === 416 && this.opened) throw this.changed();
    if (response.status === 416 && /\/0$/.test(response.headers.get("Content-Range") ?? "")) return new Uint8Array(0);
    throw new HttpError(`${this.url}: the server answered ${response.status}`, response.status);
  }

  // A weak tag may not stand there.
  private validator(): string | null {
    const here = (globalThis as { location?: { href: string } }).location?.href;
    const elsewhere = here !== undefined && new URL(this.url, here).origin !== new URL(here).origin;
    if (!(this.options.ifRange ?? !elsewhere)) return null;
    return this.etag && !this.etag.startsWith("W/") ? this.etag : this.etag ? null : this.modified;
  }

  private async takePart(response: Response, offset: number, length: number): Promise<ArrayBuffer> {
    const range = parseContentRange(response.headers.get("Content-Range"));
    if (!range || range.total === undefined || range.start !== offset) {
      this.drop(response);
      if (range && range.start !== offset) throw new SourceError(`${this.url}: the server answered with other bytes`);
      throw new RangesError(`${this.url}: the server does not tell (Content-Range) which bytes of how many it sends`);
    }
    this.recognise(response, range.total);
    const bytes = await response.arrayBuffer();
    if (bytes.byteLength !== Math.min(length, range.total - offset))
      throw new SourceError(`${this.url}: the answer has ${bytes.byteLength} bytes in place of ${length}`);
    return bytes;
  }

  // Keeps what the first answer tells of the file, and compares what the others do.
  private recognise(response: Response, total: number): void {
    const etag = response.headers.get("ETag");
    const modified = response.headers.get("Last-Modified");
    if (this.opened) {
      const strong = etag !== null && !etag.startsWith("W/");
      if (total === this.size && etag === this.etag && (strong || modified === this.modified)) return;
      this.drop(response);
      throw this.changed();
    }
    [this.size, this.etag, this.modified, this.opened] = [total, etag, modified, true];
  }

  private async takeWhole(response: Response, offset: number, length: number): Promise<Uint8Array> {
    if (this.opened) {
      this.drop(response);
      throw this.changed();
    }
    const { maxWholeBytes = 2 ** 26 } = this.options;
    const told = Number(response.headers.get("Content-Length") ?? 0);
    const reason = `${this.url}: the server gives no ranges, and the file is larger than ${maxWholeBytes} bytes`;
    const bytes = told > maxWholeBytes ? undefined : await readUpTo(response, maxWholeBytes);
    if (!bytes) {
      this.drop(response);
      throw new RangesError(reason);
    }
    if (bytes.length < told && !response.headers.has("Content-Encoding"))
      throw new SourceError(`${this.url}: the answer has ${bytes.length} bytes in place of ${told}`);
    this.whole = new BufferSource(bytes);
    this.size = bytes.length;
    return this.whole.read(offset, length);
  }

  private changed(): ChangedError {
    return new ChangedError(`${this.url}: the file has changed since it was opened`);
  }

  // Ends an answer whose bytes nobody wants.
  private drop(response: Response): void {
    response.body?.cancel().catch(() => undefined);
  }
}

// The body; nothing if it has more bytes than that.
async function readUpTo(response: Response, most: number): Promise<Uint8Array | undefined> {
  const pieces: Uint8Array[] = [];
  let size = 0;
  const reader = response.body?.getReader();
  for (let next = await reader?.read(); next && !next.done; next = await reader?.read()) {
    size += next.value.length;
    if (size > most) {
      reader?.cancel().catch(() => undefined);
      return undefined;
    }
    pieces.push(next.value);
  }
  const bytes = new Uint8Array(size);
  let at = 0;
  for (const piece of pieces) {
    bytes.set(piece, at);
    at += piece.length;
  }
  return bytes;
}

function pause(milliseconds: number, signal?: AbortSignal): Promise<void> {
  return new Promise((resolve, reject) => {
    const stop = (): void => {
      clearTimeout(timer);
      reject(signal?.reason);
    };
    const timer = setTimeout(() => {
      signal?.removeEventListener("abort", stop);
      resolve();
    }, milliseconds);
    signal?.addEventListener("abort", stop, { once: true });
  });
}
