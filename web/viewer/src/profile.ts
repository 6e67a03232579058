// The samples along a line, and their graph.
import type { Pixels } from "../../src/pyramid.js";
import { h, s, short } from "./dom.js";
import type { Line } from "./link.js";
import type { Raster } from "./raster.js";
import { isComplex, isNone, partOf, type Style } from "./style.js";

const MOST_POINTS = 1024;
const MOST_TILES = 256;

export interface Profile {
  level: number;
  /** The distance of each point from the start, in pixels of level 0. */
  distances: Float64Array;
  /** The values of each band at the points; NaN behind the edges, and where there is no data. */
  series: { band: number; values: Float64Array }[];
}

/** Reads the samples along a line from the finest level whose pixels it meets no more than some thousand of. */
export async function readProfile(raster: Raster, line: Line, style: Style, signal: AbortSignal): Promise<Profile> {
  const { pyramid } = raster;
  const length = Math.hypot(line.x1 - line.x0, line.y1 - line.y0);
  const usable = pyramid.levels.filter(({ width, height }) => width > 0 && height > 0);
  const level = usable.find(({ scale }) => length / scale <= suits(raster)) ?? usable.at(-1);
  if (!level) throw new RangeError("the pyramid has no pixels to show");
  const count = Math.min(Math.max(Math.ceil(length / level.scale) + 1, 2), MOST_POINTS);
  const bands = [...new Set(style.bands)];
  const distances = Float64Array.from({ length: count }, (_, i) => (i * length) / (count - 1));
  const series = bands.map((band) => ({ band, values: new Float64Array(count).fill(NaN) }));
  const tiles = new Map<string, number[]>(); // the points of each tile
  const { tileSize } = pyramid.header;
  const at = (i: number): [number, number] => {
    const share = i / (count - 1);
    const [x, y] = [line.x0 + share * (line.x1 - line.x0), line.y0 + share * (line.y1 - line.y0)];
    return [Math.floor(x / level.scale), Math.floor(y / level.scale)];
  };
  for (let i = 0; i < count; ++i) {
    const [x, y] = at(i);
    if (x < 0 || y < 0 || x >= level.width || y >= level.height) continue;
    const key = `${Math.floor(x / tileSize)} ${Math.floor(y / tileSize)}`;
    tiles.set(key, [...(tiles.get(key) ?? []), i]);
  }
  await Promise.all(
    [...tiles].map(async ([key, points]) => {
      const [column, row] = key.split(" ").map(Number) as [number, number];
      const tile = await pyramid.readTile(level.level, column, row, { bands, signal });
      for (const i of points) series.forEach(({ values }, k) => (values[i] = sampleOf(raster, style, tile, at(i), k)));
    }),
  );
  return { level: level.level, distances, series };
}

// With small tiles a line meets many of them.
const suits = ({ pyramid }: Raster): number => Math.min(2 * MOST_POINTS, (MOST_TILES / 2) * pyramid.header.tileSize);

function sampleOf(raster: Raster, style: Style, tile: Pixels, [x, y]: [number, number], i: number): number {
  const at = ((y - tile.y) * tile.width + (x - tile.x)) * tile.bands.length + i;
  const complex = isComplex(raster.type);
  const from = complex ? 2 * at : at;
  if (isNone(raster.type, tile.data, from, raster.noData(tile.bands[i] as number, style.noData))) return NaN;
  const raw = Number(tile.data[from]);
  return complex ? partOf(style.part, raw, Number(tile.data[from + 1])) : raw;
}

const WIDTH = 560;
const HEIGHT = 120;
const TONES = ["red", "green", "blue"];

const finite = (values: Float64Array): number[] => [...values].filter(Number.isFinite);

/** The graph of a profile, with the names of its bands and the ends of its axes. */
export function drawProfile(profile: Profile, raster: Raster, lengthText: string): HTMLElement {
  const all = profile.series.flatMap(({ values }) => finite(values));
  const [least, most] = [Math.min(...all), Math.max(...all)];
  const last = profile.distances.length - 1;
  const x = (i: number): string => ((i / last) * WIDTH).toFixed(1);
  const y = (value: number): string => (HEIGHT - 2 - ((value - least) / (most - least || 1)) * (HEIGHT - 4)).toFixed(1);
  const paths = profile.series.map(({ values }, k) => {
    let open = false;
    const parts = [...values].map((value, i) => {
      if (!Number.isFinite(value)) return ((open = false), "");
      const part = `${open ? "L" : "M"}${x(i)},${y(value)}`;
      open = true;
      return part;
    });
    return s("path", { class: `series ${toneOf(profile, k)}`, d: parts.join("") });
  });
  const told = profile.series.map(({ band, values }) => summary(raster.bandName(band), finite(values)));
  const label = `Graph of ${last + 1} points over ${lengthText}. ${told.join(". ")}`;
  const grid = s("path", { class: "grid", d: [0.25, 0.5, 0.75].map((at) => `M0,${at * HEIGHT}H${WIDTH}`).join("") });
  const svg = s(
    "svg",
    { viewBox: `0 0 ${WIDTH} ${HEIGHT}`, preserveAspectRatio: "none", role: "img", "aria-label": label },
    grid,
    ...paths,
  );
  const legend = profile.series.map(({ band }, k) =>
    h("span", { class: `key ${toneOf(profile, k)}` }, raster.bandName(band)),
  );
  return h(
    "div",
    { class: "graph" },
    h(
      "div",
      { class: "axis" },
      h("span", {}, all.length ? short(most) : ""),
      h("span", {}, all.length ? short(least) : ""),
    ),
    svg,
    h("div", { class: "legend" }, ...legend, h("span", { class: "length" }, `${lengthText}, level ${profile.level}`)),
  );
}

const toneOf = ({ series }: Profile, i: number): string => (series.length === 3 ? (TONES[i] as string) : "");

function summary(name: string, values: number[]): string {
  if (!values.length) return `${name}: no data`;
  const mean = values.reduce((sum, value) => sum + value, 0) / values.length;
  return `${name}: from ${short(Math.min(...values))} to ${short(Math.max(...values))}, mean ${short(mean)}`;
}

/** The profile as a table with commas. */
export function profileText({ distances, series }: Profile): string {
  const head = ["distance", ...series.map(({ band }) => `band ${band + 1}`)].join(",");
  const rows = [...distances].map((distance, i) =>
    [distance, ...series.map(({ values }) => values[i])].map((value) => (Number.isNaN(value) ? "" : value)).join(","),
  );
  return [head, ...rows].join("\n") + "\n";
}
