// What is under the pointer: coordinates, and the samples of every band as they stand in the file.
import type { Level } from "../../src/layout.js";
import type { Pixels } from "../../src/pyramid.js";
import { decimals, formatDegrees, type Point } from "./coordinates.js";
import { byId, h } from "./dom.js";
import type { Raster } from "./raster.js";
import { isComplex } from "./style.js";

const REST = 250; // milliseconds after which bands are asked for that are not shown
const MOST_BANDS = 4096;

/** A sample as a text: integers exactly, reals so that they read back as they are. */
export function sampleText(raster: Raster, { data }: Pixels, i: number): string {
  if (!isComplex(raster.type)) return realText(raster, data[i] as number | bigint);
  const [real, imaginary] = [data[2 * i] as number, data[2 * i + 1] as number];
  const sign = imaginary < 0 || Object.is(imaginary, -0) ? "−" : "+";
  return `${realText(raster, real)} ${sign} ${realText(raster, Math.abs(imaginary))}i`;
}

// Of a 32-bit real the shortest text that is rounded to it.
function realText({ type }: Raster, value: number | bigint): string {
  if (typeof value === "bigint" || !/Single/.test(type)) return String(value);
  for (let digits = 6; digits < 9; ++digits) {
    const shorter = Number(value.toPrecision(digits));
    if (Math.fround(shorter) === value) return String(shorter);
  }
  return String(value);
}

export class Readout {
  private readonly values = byId("values");
  private readonly place = byId("place");
  private readonly rows: HTMLElement[] = [];
  private raster: Raster | undefined;
  private abort = new AbortController();
  private timer = 0;
  private at = "";
  /** Whether the samples of the place that is shown are still on their way. */
  pending = false;

  /** Shows a place in pixels of level 0, with the samples of the level that is on the screen. */
  show(raster: Raster | undefined, point: Point | undefined, level: Level | undefined): void {
    if (raster !== this.raster) this.begin(raster);
    if (!raster || !point || !level) return this.clear();
    this.place.replaceChildren(...describe(raster, point).map((text) => h("span", {}, text)));
    const [x, y] = [Math.floor(point.x / level.scale), Math.floor(point.y / level.scale)];
    const at = `${level.level}/${x}/${y}`;
    if (at === this.at) return;
    this.at = at;
    this.abort.abort();
    this.abort = new AbortController();
    clearTimeout(this.timer);
    if (x < 0 || y < 0 || x >= level.width || y >= level.height) return this.fill(undefined, "outside");
    this.pending = true;
    const { signal } = this.abort;
    const read = (): void => void this.read(raster, level.level, x, y, signal);
    // Where the bands of a tile lie apart, each would be a request of its own.
    if (raster.pyramid.header.tileOrdering === "Morton" && raster.bands > 4) this.timer = window.setTimeout(read, REST);
    else read();
  }

  /** What is told of the place at the moment, in one line. */
  get text(): string {
    const values = this.rows.slice(0, 8).map((row) => row.textContent);
    return `${[...this.place.children].map((each) => each.textContent).join(", ")}. ${values.join(", ")}`;
  }

  /** Takes names and units of the bands anew, which have changed. */
  forget(): void {
    this.raster = undefined;
  }

  private begin(raster: Raster | undefined): void {
    this.raster = raster;
    this.at = "";
    this.rows.length = 0;
    this.values.replaceChildren();
    for (let band = 0; raster && band < Math.min(raster.bands, MOST_BANDS); ++band) {
      const row = h("dd", {}, "–");
      this.rows.push(row);
      this.values.append(h("div", {}, h("dt", {}, raster.bandName(band)), row));
    }
  }

  private clear(): void {
    this.at = "";
    this.abort.abort();
    clearTimeout(this.timer);
    this.place.replaceChildren();
    this.fill(undefined, "–");
  }

  private fill(texts: string[] | undefined, otherwise: string): void {
    this.pending = false;
    this.rows.forEach((row, i) => (row.textContent = texts?.[i] ?? otherwise));
  }

  private async read(raster: Raster, level: number, x: number, y: number, signal: AbortSignal): Promise<void> {
    try {
      const bands = this.rows.map((_, band) => band);
      const pixels = await raster.pyramid.readWindow(level, { x, y, width: 1, height: 1 }, { bands, signal });
      if (signal.aborted) return;
      this.fill(
        bands.map((band) => `${sampleText(raster, pixels, band)} ${raster.unit(band)}`.trim()),
        "–",
      );
    } catch {
      if (!signal.aborted) this.fill(undefined, "–"); // the picture tells what is wrong
    }
  }
}

/** A place: column and row, coordinates in the raster's own system, degrees. */
export function describe(raster: Raster, point: Point): string[] {
  const texts = [`column ${Math.floor(point.x)}, row ${Math.floor(point.y)}`];
  const { georeference } = raster;
  if (!georeference) return texts;
  const at = georeference.coordinates(point);
  const digits = decimals(Math.hypot(georeference.transform[1] as number, georeference.transform[4] as number));
  if (!georeference.geographic) texts.push(`${at.x.toFixed(digits)}, ${at.y.toFixed(digits)}`);
  const degrees = georeference.degrees(point);
  const beside = georeference.degrees({ x: point.x + 1, y: point.y });
  if (degrees) texts.push(formatDegrees(degrees, beside ? decimals(Math.abs(beside.x - degrees.x) || 1e-6) : 5));
  else if (georeference.geographic) texts.push(formatDegrees(at, digits));
  return texts;
}
