/**
 * Pyramid files in the file system of Node.
 *
 * @packageDocumentation
 */
import { type FileHandle, open } from "node:fs/promises";

import { ChangedError, type OpenOptions, Pyramid, type Source, SourceError } from "./index.js";

/**
 * An open file. It keeps to what it opened whatever happens to the name; one that is written to meanwhile gives a
 * {@link ChangedError}, as told by its size and the time of its last change.
 */
export class FileSource implements Source {
  private constructor(
    private readonly name: string,
    private readonly file: FileHandle,
    readonly size: number,
    private readonly changed: bigint,
  ) {}

  /** @throws SourceError if there is no such file, or it cannot be read */
  static async open(name: string): Promise<FileSource> {
    let file: FileHandle | undefined;
    try {
      file = await open(name, "r");
      const stat = await file.stat({ bigint: true });
      if (!stat.isFile()) throw new Error("it is no regular file");
      return new FileSource(name, file, Number(stat.size), stat.mtimeNs);
    } catch (cause) {
      await file?.close();
      throw new SourceError(`${name}: ${(cause as Error).message}`, { cause });
    }
  }

  async read(offset: number, length: number, signal?: AbortSignal): Promise<Uint8Array> {
    const bytes = new Uint8Array(Math.max(Math.min(length, this.size - offset), 0));
    let at = 0;
    while (at < bytes.length) {
      signal?.throwIfAborted();
      const { bytesRead } = await this.file.read(bytes, at, bytes.length - at, offset + at);
      if (bytesRead === 0) break;
      at += bytesRead;
    }
    const stat = await this.file.stat({ bigint: true });
    if (stat.mtimeNs !== this.changed || Number(stat.size) !== this.size)
      throw new ChangedError(`${this.name}: the file has changed since it was opened`);
    return bytes;
  }

  close(): Promise<void> {
    return this.file.close();
  }
}

/** Opens a file by its name; it is the caller's to close. */
export async function openFile(name: string, options: OpenOptions = {}): Promise<Pyramid> {
  const source = await FileSource.open(name);
  try {
    return await Pyramid.open(source, options);
  } catch (error) {
    await source.close();
    throw error;
  }
}
