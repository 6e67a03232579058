// The whole view as a text behind the # of a link, and back. What a link says wrongly is left out.
import type { View } from "./camera.js";
import { type Part, PARTS, type Style } from "./style.js";

export interface Line {
  x0: number;
  y0: number;
  x1: number;
  y1: number;
}

/** One side of the picture: a file, and the style that it has; what is not told is as usual for the file. */
export interface SideState {
  file?: string;
  /** The name of a file of the user's own, which a link cannot open. */
  local?: string;
  style?: Partial<Style>;
}

export interface State {
  sides: SideState[];
  /** Of the first raster; its zoom in pixels as the page counts them. */
  view?: View;
  /** Where the two sides meet, from 0 to 1. */
  swipe?: number;
  line?: Line;
  background?: "plain";
}

const text = (value: number): string => String(Number(value.toPrecision(15)));
const short = (value: number): string => String(Number(value.toFixed(3)));

function writeStyle(out: URLSearchParams, prefix: string, style: Partial<Style>): void {
  const { bands, ranges, gamma, colors, noData, part, alpha } = style;
  if (bands) out.set(`${prefix}bands`, bands.map((band) => band + 1).join(","));
  if (alpha !== undefined) out.set(`${prefix}alpha`, String(alpha + 1));
  const known = bands?.map((band) => ranges?.[band]);
  if (known?.every((range) => range !== undefined))
    out.set(`${prefix}stretch`, known.map(({ minimum, maximum }) => `${text(minimum)},${text(maximum)}`).join(";"));
  if (gamma !== undefined && gamma !== 1) out.set(`${prefix}gamma`, text(gamma));
  if (colors !== undefined && colors !== "grey") out.set(`${prefix}colormap`, colors);
  if (noData !== undefined && noData !== "file") out.set(`${prefix}nodata`, noData);
  if (part !== undefined && part !== "magnitude") out.set(`${prefix}complex`, part);
}

/** The text of a state, without the #. */
export function writeLink({ sides, view, swipe, line, background }: State): string {
  const out = new URLSearchParams();
  sides.forEach(({ file, local, style }, i) => {
    const prefix = i ? "b." : "";
    if (file !== undefined) out.set(`${prefix}file`, file);
    if (local !== undefined) out.set(`${prefix}local`, local);
    if (style) writeStyle(out, prefix, style);
  });
  if (view) out.set("at", `${short(view.x)},${short(view.y)}`);
  if (view) out.set("zoom", String(Number(view.zoom.toPrecision(7))));
  if (swipe !== undefined) out.set("swipe", short(swipe));
  if (line) out.set("line", [line.x0, line.y0, line.x1, line.y1].map(short).join(","));
  if (background) out.set("background", background);
  // These may stand in a link as they are, and are easier to read so.
  return out.toString().replace(/%2C/g, ",").replace(/%2F/g, "/").replace(/%3A/g, ":").replace(/%3B/g, ";");
}

/** What the address of the page says: the state behind the #, or a file behind the ?. */
export function asked(): State {
  const state = readLink(location.hash);
  const file = new URLSearchParams(location.search).get("file");
  if (!state.sides.length && file) state.sides.push({ file, style: {} });
  return state;
}

/** Numbers with commas between them, if they are as many as that. */
function numbers(text: string | null, count: number): number[] | undefined {
  // A plus that was typed into an address comes as a blank.
  const list = text?.split(",").map((each) => (each.trim() === "" ? NaN : Number(each.replace(/e /i, "e+"))));
  return list?.length === count && list.every(Number.isFinite) ? list : undefined;
}

function readBands(text: string | null): number[] | undefined {
  const bands = text?.split(",").map((each) => Number(each) - 1);
  const usable = bands && (bands.length === 1 || bands.length === 3);
  return usable && bands.every((band) => Number.isInteger(band) && band >= 0) ? bands : undefined;
}

function readStyle(from: URLSearchParams, prefix: string): Partial<Style> {
  const style: Partial<Style> = {};
  const bands = readBands(from.get(`${prefix}bands`));
  if (bands) style.bands = bands;
  const [alpha] = numbers(from.get(`${prefix}alpha`), 1) ?? [];
  if (bands) style.alpha = alpha !== undefined && Number.isInteger(alpha) && alpha > 0 ? alpha - 1 : undefined;
  const pairs = from.get(`${prefix}stretch`)?.split(";");
  const ranges: Style["ranges"] = {};
  bands?.forEach((band, i) => {
    const [minimum, maximum] = numbers(pairs?.[i] ?? null, 2) ?? [];
    if (minimum !== undefined && maximum !== undefined) ranges[band] = { minimum, maximum };
  });
  style.ranges = ranges;
  const [gamma] = numbers(from.get(`${prefix}gamma`), 1) ?? [];
  if (gamma !== undefined && gamma >= 0.01 && gamma <= 100) style.gamma = gamma;
  const part = from.get(`${prefix}complex`) as Part | null;
  if (part && PARTS.includes(part)) style.part = part;
  const colors = from.get(`${prefix}colormap`);
  if (colors) style.colors = colors;
  else if (bands) style.colors = "grey";
  const noData = from.get(`${prefix}nodata`);
  if (noData && (noData === "none" || !Number.isNaN(Number(noData)) || noData === "nan")) style.noData = noData;
  return style;
}

/** What a link says; the # in front may be there. */
export function readLink(hash: string): State {
  const from = new URLSearchParams(hash.replace(/^#/, ""));
  const state: State = { sides: [] };
  for (const prefix of ["", "b."]) {
    const [file, local] = [from.get(`${prefix}file`), from.get(`${prefix}local`)];
    if (file === null && local === null) continue;
    const side: SideState = { style: readStyle(from, prefix) };
    if (file !== null) side.file = file;
    if (local !== null) side.local = local;
    state.sides.push(side);
  }
  const [x, y] = numbers(from.get("at"), 2) ?? [];
  const [zoom] = numbers(from.get("zoom"), 1) ?? [];
  if (x !== undefined && y !== undefined && zoom !== undefined && zoom > 0) state.view = { x, y, zoom };
  const [swipe] = numbers(from.get("swipe"), 1) ?? [];
  if (swipe !== undefined && state.sides.length === 2) state.swipe = Math.min(Math.max(swipe, 0), 1);
  const [x0, y0, x1, y1] = numbers(from.get("line"), 4) ?? [];
  if (x0 !== undefined) state.line = { x0, y0: y0 as number, x1: x1 as number, y1: y1 as number };
  if (from.get("background") === "plain") state.background = "plain";
  return state;
}
