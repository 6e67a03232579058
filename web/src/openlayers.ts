/**
 * Pyramids in OpenLayers, as the source of a `WebGLTile` layer: the samples themselves go to the graphics
 * processor, and the style of the layer tells how they look.
 *
 * @packageDocumentation
 */
import type { AttributionLike } from "ol/source/Source.js";
import type { ProjectionLike } from "ol/proj.js";
import DataTileSource from "ol/source/DataTile.js";
import TileGrid from "ol/tilegrid/TileGrid.js";

import type { Level, Pixels, Pyramid } from "./index.js";

/** How a pyramid lies in a map. */
export interface PyramidSourceOptions {
  /** Bands from 0, in the order in which the style counts them from 1; all by default. */
  bands?: readonly number[];
  /** The upper left corner of the raster in units of the projection; [0, 0] by default. */
  origin?: readonly [number, number];
  /** The side of a pixel of level 0 in units of the projection; 1 by default. */
  pixelSize?: number;
  /** The projection of the raster; that of the view by default. */
  projection?: ProjectionLike;
  /** Pixels of which all bands have this value are transparent. */
  noData?: number;
  /** Whether samples between pixels are interpolated; true by default. */
  interpolate?: boolean;
  attributions?: AttributionLike;
}

const area = ({ width, height }: Level): number => width * height;

/**
 * A source of `WebGLTile` layers. A tile has one channel more than bands, the last: it is full where there is a
 * pixel, and 0 behind the edges and where there is no data. Bytes stay bytes, which a style sees from 0 to 1; all
 * other types become 32-bit reals, complex samples their magnitude. What fails to load is an error of its tile.
 *
 * @throws RangeError for a pyramid without pixels, or a band that it does not have
 */
export function createSource(pyramid: Pyramid, options: PyramidSourceOptions = {}): DataTileSource {
  const { header } = pyramid;
  const bands = options.bands ?? Array.from({ length: header.bands }, (_, band) => band);
  const levels = pyramid.levels.filter(area).reverse();
  const finest = levels[levels.length - 1];
  if (!finest || !bands.length) throw new RangeError("the pyramid has no pixels to show");
  const wrong = bands.find((band) => !(Number.isInteger(band) && band >= 0 && band < header.bands));
  if (wrong !== undefined) throw new RangeError(`the file has no band ${wrong}`);
  const { origin: [left, top] = [0, 0], pixelSize = 1, interpolate = true } = options;
  const extent = [left, top - header.height * pixelSize, left + header.width * pixelSize, top];
  const tileGrid = new TileGrid({
    origin: [left, top],
    extent,
    tileSize: header.tileSize,
    resolutions: levels.map(({ scale }) => scale * pixelSize),
  });
  return new DataTileSource({
    tileGrid,
    tileSize: header.tileSize,
    bandCount: bands.length + 1,
    interpolate,
    ...(options.projection !== undefined && { projection: options.projection }),
    ...(options.attributions !== undefined && { attributions: options.attributions }),
    loader: async (z, x, y, { signal }) => {
      const level = levels[z] as Level;
      // Where a level lost its last columns to rounding, the grid has tiles that it does not.
      if (x >= level.tilesAcross || y >= level.tilesDown)
        return texture(header.pixelType === "Byte", header.tileSize, bands.length);
      return pad(await pyramid.readTile(level.level, x, y, { bands, signal }), header.tileSize, options.noData);
    },
  });
}

const texture = (isByte: boolean, side: number, bands: number): Uint8Array | Float32Array =>
  new (isByte ? Uint8Array : Float32Array)(side * side * (bands + 1));

function pad(
  { data, width, height, bands, pixelType }: Pixels,
  side: number,
  noData?: number,
): Uint8Array | Float32Array {
  const isByte = pixelType === "Byte";
  const isComplex = pixelType.startsWith("Complex");
  const count = bands.length;
  const out = texture(isByte, side, count);
  for (let y = 0; y < height; ++y)
    for (let x = 0; x < width; ++x) {
      const from = (y * width + x) * count;
      const to = (y * side + x) * (count + 1);
      let empty = noData !== undefined;
      for (let i = 0; i < count; ++i) {
        const at = from + i;
        const value = isComplex ? Math.hypot(Number(data[2 * at]), Number(data[2 * at + 1])) : Number(data[at]);
        out[to + i] = value;
        empty &&= value === noData || (value !== value && noData !== noData);
      }
      out[to + count] = empty ? 0 : isByte ? 255 : 1;
    }
  return out;
}
