/**
 * Reads pyramid files in browsers and in Node, over HTTP ranges or from anywhere else.
 *
 * ```ts
 * const pyramid = await Pyramid.open("https://example.org/scene.pyr");
 * const { data, width, height } = await pyramid.readTile(pyramid.header.levelMax, 0, 0);
 * ```
 *
 * @packageDocumentation
 */
export type { ChunkOptions } from "./chunks.js";
export { ChangedError, FormatError, HttpError, LimitError, PyramidError, RangesError, SourceError } from "./errors.js";
export type { Header, TileOrdering } from "./header.js";
export type { Level, Rectangle } from "./layout.js";
export type { Histogram, Metadata, Statistics } from "./metadata.js";
export { type OpenOptions, type Pixels, Pyramid, type ReadOptions } from "./pyramid.js";
export { BlobSource, BufferSource, type HttpOptions, HttpSource, type Source } from "./source.js";
export type { PixelType, PixelValue, SampleArray, SampleArrays } from "./types.js";
