// The controls beside the picture. They are made anew where what can be chosen changes; the focus stays.
import { COLOR_MAPS } from "./colormaps.js";
import { choice, h, short } from "./dom.js";
import { HistogramView } from "./histogram.js";
import type { Raster } from "./raster.js";
import { isComplex, isReal, type Part, type Range, rangeOfType, type Style } from "./style.js";

/** What the controls are told, and what they tell. */
export interface PanelModel {
  raster: Raster;
  style: Style;
  /** Which of two sides is meant; nothing where there is one. */
  side: 0 | 1 | undefined;
  plain: boolean;
  /** The style has changed; with `structure` in what there is to choose. */
  change(style: Style, structure: boolean): void;
  chooseSide(side: 0 | 1): void;
  chooseFile(): void;
  choosePlain(plain: boolean): void;
}

const TONES = ["red", "green", "blue"] as const;
const COLORS = ["Red", "Green", "Blue"] as const;

/** Fills the panel. */
export function showPanel(panel: HTMLElement, model: PanelModel): void {
  const focused = panel.contains(document.activeElement) ? keyOf(document.activeElement as HTMLElement) : undefined;
  const { raster, style } = model;
  panel.replaceChildren(
    ...[
      model.side !== undefined && sides(model.side, model),
      bands(model),
      isComplex(raster.type) && parts(model),
      style.colors === "palette" && style.bands.length === 1 ? undefined : stretch(model),
      style.bands.length === 1 && colors(model),
      empty(model),
      about(raster),
    ].filter((each) => each instanceof HTMLElement),
  );
  if (focused) [...panel.querySelectorAll<HTMLElement>(FOCUSABLE)].find((each) => keyOf(each) === focused)?.focus();
}

const FOCUSABLE = "select, input, button, [tabindex]";
const keyOf = (element: HTMLElement): string =>
  `${element.tagName} ${element.getAttribute("aria-label") ?? element.closest("label")?.firstElementChild?.textContent ?? element.textContent}`;

function section(title: string, ...children: (HTMLElement | undefined | false)[]): HTMLElement {
  return h("section", {}, h("h2", {}, title), ...children);
}

/** Buttons of which one is chosen. */
function segments<T extends string>(
  label: string,
  values: readonly (readonly [T, string])[],
  now: T,
  take: (value: T) => void,
): HTMLElement {
  const buttons = values.map(([value, text]) =>
    h("button", { type: "button", "aria-pressed": String(value === now), onclick: () => take(value) }, text),
  );
  return h("div", { class: "segments", role: "group", "aria-label": label }, ...buttons);
}

function sides(side: 0 | 1, model: PanelModel): HTMLElement {
  const values = [
    ["0", "Left side"],
    ["1", "Right side"],
  ] as const;
  return h(
    "section",
    {},
    segments("Side of the picture", values, String(side) as "0" | "1", (value) =>
      model.chooseSide(value === "0" ? 0 : 1),
    ),
    h("p", { class: "note file" }, model.raster.origin.name),
    h("button", { type: "button", class: "quiet", onclick: () => model.chooseFile() }, "Another file on this side…"),
  );
}

function bands({ raster, style, change }: PanelModel): HTMLElement | undefined {
  if (raster.bands === 1) return undefined;
  const all = Array.from({ length: raster.bands }, (_, band) => [String(band), raster.bandName(band)] as const);
  const three = style.bands.length === 3;
  const mode = segments(
    "Bands together",
    [
      ["1", "One band"],
      ["3", "Three bands"],
    ] as const,
    three ? "3" : "1",
    (value) => {
      const [first] = style.bands as [number];
      const next = value === "1" ? [first] : [0, 1, 2].map((i) => Math.min(first + i, raster.bands - 1));
      const again = raster.bands > 2 && first + 2 >= raster.bands ? [0, 1, 2] : next;
      change({ ...style, bands: value === "1" ? next : again, ranges: {}, colors: "grey" }, true);
    },
  );
  const lists = style.bands.map((band, i) =>
    choice(three ? (COLORS[i] as string) : "Band", all, String(band), (value) => {
      const next = style.bands.map((each, k) => (k === i ? Number(value) : each));
      const palette = !three && style.colors === "palette" && !raster.palette(Number(value));
      change({ ...style, bands: next, ...(palette && { colors: "grey" }) }, true);
    }),
  );
  const alpha = choice("Opacity", [["", "All opaque"], ...all], String(style.alpha ?? ""), (value) =>
    change({ ...style, alpha: value === "" ? undefined : Number(value) }, true),
  );
  return section("Bands", mode, ...lists, alpha);
}

function parts({ style, change }: PanelModel): HTMLElement {
  const names = [
    ["magnitude", "Magnitude"],
    ["real", "Real part"],
    ["imaginary", "Imaginary part"],
    ["phase", "Phase"],
  ] as const;
  return section(
    "Complex samples",
    choice("Shown", names, style.part, (part) => change({ ...style, part: part as Part, ranges: {} }, true)),
  );
}

const STRETCHES = [
  ["", "By hand"],
  ["percent", "2 to 98 per cent"],
  ["type", "Whole type"],
  ["ends", "Minimum to maximum"],
  ["deviations", "Mean ± 2 deviations"],
] as const;

/** The stretch that a name stands for; nothing where the file does not tell enough. */
function named(name: string, raster: Raster, band: number, part: Part): Range | undefined {
  const found = raster.distribution(band, part);
  if (name === "type") return rangeOfType(raster.type);
  if (!found) return undefined;
  if (name === "percent") return raster.percentiles(found, 2, 98);
  if (name === "ends") return raster.ends(band, part);
  const { mean, deviation } = found;
  if (name !== "deviations" || mean === undefined || deviation === undefined) return undefined;
  return { minimum: mean - 2 * deviation, maximum: mean + 2 * deviation };
}

const same = (a: Range | undefined, b: Range | undefined): boolean =>
  a !== undefined && b !== undefined && a.minimum === b.minimum && a.maximum === b.maximum;

function stretch({ raster, style, change }: PanelModel): HTMLElement {
  const bands = [...new Set(style.bands)];
  const rangeOf = (band: number): Range => style.ranges[band] ?? rangeOfType(raster.type);
  const offered = STRETCHES.filter(([name]) => {
    if (name === "type" && isReal(raster.type)) return false;
    return name === "" || bands.every((band) => named(name, raster, band, style.part));
  });
  const now = (): string =>
    offered.find(([name]) => bands.every((band) => same(named(name, raster, band, style.part), rangeOf(band))))?.[0] ??
    "";
  const list = choice("Range", offered, now(), (name) => {
    const ranges = { ...style.ranges };
    for (const band of bands) ranges[band] = named(name, raster, band, style.part) ?? rangeOf(band);
    change({ ...style, ranges }, true);
  });
  const views = bands.map((band) => {
    const tone = style.bands.length === 3 ? TONES[style.bands.indexOf(band)] : "";
    const view = new HistogramView(raster.bandName(band), tone ?? "", !isReal(raster.type), (range) => {
      style.ranges = { ...style.ranges, [band]: range };
      change(style, false);
      (list.lastElementChild as HTMLSelectElement).value = now();
    });
    view.show(raster.distribution(band, style.part), rangeOf(band));
    return view.element;
  });
  return section("Stretch", list, ...views, gamma(style, change));
}

// The slider moves by the logarithm: 1 is in its middle.
function gamma(style: Style, change: PanelModel["change"]): HTMLElement {
  const output = h("output", {}, style.gamma.toFixed(2));
  const slider = h("input", {
    type: "range",
    min: -1,
    max: 1,
    step: 0.01,
    value: Math.log2(style.gamma) / 2,
    "aria-valuetext": style.gamma.toFixed(2),
    oninput: () => {
      style.gamma = Number((2 ** (2 * slider.valueAsNumber)).toFixed(3));
      output.textContent = style.gamma.toFixed(2);
      slider.setAttribute("aria-valuetext", style.gamma.toFixed(2));
      change(style, false);
    },
  });
  return h("label", { class: "field" }, h("span", {}, "Gamma"), slider, output);
}

function colors({ raster, style, change }: PanelModel): HTMLElement {
  const band = style.bands[0] as number;
  const palette = raster.palette(band);
  const name = style.colors.replace(/^-/, "");
  const names = [...COLOR_MAPS.keys()].map((each) => [each, each[0]?.toUpperCase() + each.slice(1)] as const);
  const list = choice("Colours", palette ? [["palette", "Palette of the file"], ...names] : names, name, (value) =>
    change({ ...style, colors: value }, true),
  );
  const strip = h("canvas", { class: "strip", width: 256, height: 1, "aria-hidden": "true" });
  const map = COLOR_MAPS.get(name);
  if (name === "palette" && palette) strip.width = Math.min(Math.max(palette.length / 4, 1), 4096);
  const source = name === "palette" ? palette : map;
  if (source) paint(strip, source, style.colors.startsWith("-"));
  const reversed = h("input", {
    type: "checkbox",
    checked: style.colors.startsWith("-"),
    onchange: () => change({ ...style, colors: (reversed.checked ? "-" : "") + name }, true),
  });
  const turn = h("label", { class: "check" }, reversed, h("span", {}, "Reversed"));
  return section("Colours", list, strip, name !== "palette" && turn);
}

function paint(strip: HTMLCanvasElement, colors: Uint8Array, reversed: boolean): void {
  const picture = new ImageData(strip.width, 1);
  for (let i = 0; i < strip.width; ++i) {
    const from = 4 * (reversed ? strip.width - 1 - i : i);
    picture.data.set(colors.subarray(from, from + 4), 4 * i);
  }
  strip.getContext("2d")?.putImageData(picture, 0, 0);
}

function empty({ raster, style, change, plain, choosePlain }: PanelModel): HTMLElement {
  const told = raster.noData(style.bands[0] as number, "file");
  const own = style.noData !== "file" && style.noData !== "none";
  const names = [
    [
      "file",
      told === undefined
        ? "As the file says (none)"
        : `As the file says (${typeof told === "bigint" ? told : short(told)})`,
    ],
    ["none", "All samples count"],
    ["own", "A value"],
  ] as const;
  const list = choice("No data", names, own ? "own" : style.noData, (value) =>
    change({ ...style, noData: value === "own" ? String(told ?? 0) : value }, true),
  );
  const value = h("input", {
    type: "text",
    inputmode: "decimal",
    value: own ? style.noData : "",
    onchange: () => {
      const text = value.value.trim();
      if (text !== "" && (!Number.isNaN(Number(text)) || text === "nan")) change({ ...style, noData: text }, true);
      else value.value = style.noData;
    },
  });
  const backgrounds = [
    ["chequers", "Chequers"],
    ["plain", "Plain"],
  ] as const;
  return section(
    "No data",
    list,
    own && h("label", { class: "field" }, h("span", {}, "Value"), value),
    choice("Background", backgrounds, plain ? "plain" : "chequers", (each) => choosePlain(each === "plain")),
  );
}

function about(raster: Raster): HTMLElement {
  const { header, levels, complete, fileSize } = raster.pyramid;
  const { georeference, metadata } = raster;
  const rows: [string, string][] = [
    ["File", raster.origin.name],
    ["Size", `${raster.width} × ${raster.height} pixels`],
    ["Bands", `${raster.bands} of ${raster.type}`],
    ["Levels", `${levels.length}, tiles of ${header.tileSize}, ${header.tileOrdering}`],
  ];
  if (fileSize !== undefined) rows.push(["Bytes", formatBytes(fileSize)]);
  if (georeference) rows.push(["System", georeference.name]);
  if (!complete) rows.push(["State", "not complete: what is missing shows as zeros"]);
  if (metadata.fault) rows.push(["Records", metadata.fault]);
  const list = h("dl", {}, ...rows.flatMap(([term, text]) => [h("dt", {}, term), h("dd", {}, text)]));
  return h(
    "details",
    { class: "about", open: Boolean(metadata.fault) || !complete },
    h("summary", {}, "About the file"),
    list,
  );
}

function formatBytes(bytes: number): string {
  const power = Math.min(Math.floor(Math.log10(Math.max(bytes, 1)) / 3), 4);
  return `${short(bytes / 1000 ** power, 3)} ${["bytes", "kB", "MB", "GB", "TB"][power]}`;
}
