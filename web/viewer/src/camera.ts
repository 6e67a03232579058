// The view: arithmetic between pixels of a raster and those of the screen. Nothing here touches the page.
import type { Level } from "../../src/layout.js";
import type { Point } from "./coordinates.js";

/** What is in the middle of the screen, in pixels of level 0, and how many pixels of the screen each has. */
export interface View {
  x: number;
  y: number;
  zoom: number;
}

export interface Size {
  width: number;
  height: number;
}

/** How a raster lies on the screen: pixel (x, y) of level 0 begins at (left + x * scaleX, top + y * scaleY). */
export interface Placement {
  left: number;
  top: number;
  scaleX: number;
  scaleY: number;
}

/** From pixels of the first raster to those of another one, along each axis. */
export interface Alignment {
  scaleX: number;
  scaleY: number;
  x: number;
  y: number;
}

export const SAME: Alignment = { scaleX: 1, scaleY: 1, x: 0, y: 0 };
export const MOST_ZOOM = 128;

/** Where a raster lies; whole pixels of the screen, so that samples at 1:1 are not between two of them. */
export function placementOf(view: View, screen: Size): Placement {
  const left = Math.round(screen.width / 2 - view.x * view.zoom);
  const top = Math.round(screen.height / 2 - view.y * view.zoom);
  return { left, top, scaleX: view.zoom, scaleY: view.zoom };
}

export function aligned({ left, top, scaleX, scaleY }: Placement, to: Alignment): Placement {
  const [x, y] = [scaleX / to.scaleX, scaleY / to.scaleY];
  return { left: left - to.x * x, top: top - to.y * y, scaleX: x, scaleY: y };
}

export const toPixel = ({ left, top, scaleX, scaleY }: Placement, { x, y }: Point): Point => ({
  x: (x - left) / scaleX,
  y: (y - top) / scaleY,
});

export const toScreen = ({ left, top, scaleX, scaleY }: Placement, { x, y }: Point): Point => ({
  x: left + x * scaleX,
  y: top + y * scaleY,
});

/** The whole raster, with a little room around it. */
export function fitting({ width, height }: Size, screen: Size): View {
  const zoom = Math.min(screen.width / width, screen.height / height) * 0.94;
  return { x: width / 2, y: height / 2, zoom: Math.min(zoom || 1, MOST_ZOOM) };
}

/** Nearer or farther, with the place under a point of the screen left where it is. */
export function zoomed(view: View, screen: Size, at: Point, factor: number, least: number): View {
  const zoom = nice(Math.min(Math.max(view.zoom * factor, least), MOST_ZOOM));
  const [dx, dy] = [at.x - screen.width / 2, at.y - screen.height / 2];
  return { x: view.x + dx / view.zoom - dx / zoom, y: view.y + dy / view.zoom - dy / zoom, zoom };
}

// A power of two is meant where it is all but reached: there samples and pixels of the screen are the same.
function nice(zoom: number): number {
  const power = 2 ** Math.round(Math.log2(zoom));
  return Math.abs(zoom / power - 1) < 1e-6 ? power : zoom;
}

/** The view with its middle inside of the raster. */
export const inside = (view: View, { width, height }: Size): View => ({
  ...view,
  x: Math.min(Math.max(view.x, 0), width),
  y: Math.min(Math.max(view.y, 0), height),
});

/** The level whose pixels are nearest in size to those of the screen. */
export function levelFor(levels: readonly Level[], { scaleX, scaleY }: Placement): Level {
  const wanted = Math.round(-Math.log2(Math.sqrt(scaleX * scaleY)));
  const usable = levels.filter(({ width, height }) => width > 0 && height > 0);
  const first = usable[0] as Level;
  return usable[Math.min(Math.max(wanted - first.level, 0), usable.length - 1)] as Level;
}

/** Columns and rows of tiles of a level that a screen shows; both ends are in it. */
export interface TileRange {
  left: number;
  top: number;
  right: number;
  bottom: number;
}

export function visibleTiles(level: Level, side: number, placement: Placement, screen: Size): TileRange {
  const from = toPixel(placement, { x: 0, y: 0 });
  const to = toPixel(placement, { x: screen.width, y: screen.height });
  const extent = side * level.scale;
  return {
    left: Math.max(Math.floor(from.x / extent), 0),
    top: Math.max(Math.floor(from.y / extent), 0),
    right: Math.min(Math.ceil(to.x / extent), level.tilesAcross) - 1,
    bottom: Math.min(Math.ceil(to.y / extent), level.tilesDown) - 1,
  };
}

export const countOf = ({ left, top, right, bottom }: TileRange): number =>
  Math.max(right - left + 1, 0) * Math.max(bottom - top + 1, 0);
