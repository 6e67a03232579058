// An open file with all that is known of it: what the header and the records say, its place on the earth, and how it
// is best shown at first.
import type { Metadata } from "../../src/metadata.js";
import { Pyramid } from "../../src/pyramid.js";
import type { PixelType } from "../../src/types.js";
import { SAME, type Alignment } from "./camera.js";
import { Georeference, georeferenceOf } from "./coordinates.js";
import { archived, type Distribution, percentile, sampled } from "./distribution.js";
import { parseSidecar, type Sidecar, type SidecarBand } from "./sidecar.js";
import { isComplex, isReal, isWide, type Part, type Range, rangeOfType, type Style } from "./style.js";

/** Where a file is: at a URL, or chosen by the user, who may have chosen its sidecar as well. */
export interface Origin {
  name: string;
  url?: string;
  file?: File;
  sidecar?: File;
}

export const originOf = (url: string): Origin => {
  const path = new URL(url, document.baseURI).pathname.replace(/\/+$/, "");
  const name = path.slice(path.lastIndexOf("/") + 1);
  try {
    return { url, name: decodeURIComponent(name) || url };
  } catch {
    return { url, name };
  }
};

const CACHE_BYTES = 160 * 2 ** 20;
const MOST_SIDECAR_BYTES = 2 ** 22;
const MOST_SAMPLED = 2 ** 20; // samples that a distribution is made of

export class Raster {
  readonly width: number;
  readonly height: number;
  readonly bands: number;
  readonly type: PixelType;
  private sidecar: Sidecar = { bands: [] };
  georeference: Georeference | undefined;
  private readonly distributions = new Map<string, Distribution>();

  private constructor(
    readonly origin: Origin,
    readonly pyramid: Pyramid,
    readonly metadata: Metadata,
  ) {
    const { width, height, bands, pixelType } = pyramid.header;
    [this.width, this.height, this.bands, this.type] = [width, height, bands, pixelType];
    if (metadata.sidecar) this.take(metadata.sidecar);
  }

  /** Opens a file and reads its records: two requests. Rejects as the reader does. */
  static async open(origin: Origin, signal: AbortSignal): Promise<Raster> {
    const from = origin.file ?? new URL(origin.url as string, document.baseURI);
    const pyramid = await Pyramid.open(from, { cacheBytes: CACHE_BYTES, signal });
    if (!pyramid.levels.some(({ width, height }) => width > 0 && height > 0) || pyramid.header.bands === 0)
      throw new RangeError("the pyramid has no pixels to show");
    return new Raster(origin, pyramid, await pyramid.metadata({ signal }));
  }

  /**
   * Takes what stands beside a file that has no items of a sidecar itself. Answers whether anything was found; a
   * sidecar that is not there, or cannot be had, is none.
   */
  async readSidecar(signal: AbortSignal): Promise<boolean> {
    if (this.metadata.sidecar !== undefined) return false;
    const text = await this.sidecarText(signal).catch(() => undefined);
    if (!text || signal.aborted) return false;
    this.take(text);
    await this.recount(signal).catch(() => {}); // what was counted stays
    return true;
  }

  // Values without data were counted before they were known to be such.
  private async recount(signal: AbortSignal): Promise<void> {
    for (const [key, { archived }] of this.distributions) {
      const [band, part] = key.split(" ") as [string, Part | ""];
      if (!archived && this.told(Number(band)).noData !== undefined)
        this.distributions.set(key, await this.sample(Number(band), part || "magnitude", signal));
    }
  }

  private async sidecarText(signal: AbortSignal): Promise<string | undefined> {
    const { file, sidecar, url } = this.origin;
    if (sidecar) return sidecar.size > MOST_SIDECAR_BYTES ? undefined : await sidecar.text();
    if (file || url === undefined) return undefined;
    const beside = new URL(url, document.baseURI);
    beside.pathname += ".aux.xml";
    const response = await fetch(beside, { signal, credentials: "same-origin" });
    const told = Number(response.headers.get("Content-Length") ?? 0);
    if (response.ok && told <= MOST_SIDECAR_BYTES) return await response.text();
    await response.body?.cancel();
    return undefined;
  }

  private take(text: string): void {
    this.sidecar = parseSidecar(text);
    this.georeference = georeferenceOf(this.sidecar);
  }

  private told(band: number): SidecarBand {
    return this.sidecar.bands[band] ?? {};
  }

  /** "Band 1", with the description that the file gives. */
  bandName(band: number): string {
    const { description } = this.told(band);
    return description ? `${band + 1} ${description}` : `Band ${band + 1}`;
  }

  unit(band: number): string {
    return this.told(band).unit ?? "";
  }

  palette(band: number): Uint8Array | undefined {
    return this.metadata.palette(band);
  }

  /** The value of a band that stands for no data, in the style's choice. Of the 64-bit types it is a bigint. */
  noData(band: number, choice: string): number | bigint | undefined {
    const text = choice === "file" ? this.told(band).noData : choice === "none" ? undefined : choice;
    if (text === undefined || text.trim() === "") return undefined;
    const value = Number(text);
    // Not-a-number is no data without being told.
    if (!isWide(this.type) && Number.isNaN(value)) return undefined;
    if (!isWide(this.type)) return this.type.endsWith("Single") ? Math.fround(value) : value;
    if (/^\s*-?\d+\s*$/.test(text)) return BigInt(text);
    return Number.isInteger(value) ? BigInt(value) : undefined;
  }

  /** The distribution that is known without asking for anything: the archived one. */
  private archivedOf(band: number): Distribution | undefined {
    const whole = !isReal(this.type);
    const all = this.metadata.histograms.filter((each) => each.band === band).sort((a, b) => a.level - b.level);
    const found = all.map((each) => archived(each, whole)).find(Boolean);
    const statistics = this.metadata.statistics(band);
    return found && { ...found, mean: statistics?.mean, deviation: statistics?.standardDeviation };
  }

  /** How the values of a band are spread; of complex samples those of the part that is shown. */
  distribution(band: number, part: Part): Distribution | undefined {
    return this.distributions.get(`${band} ${isComplex(this.type) ? part : ""}`);
  }

  /** Sees to it that the distributions of some bands are known, from the coarsest level where none is archived. */
  async learn(bands: readonly number[], part: Part, signal: AbortSignal): Promise<void> {
    const complex = isComplex(this.type);
    for (const band of new Set(bands)) {
      const key = `${band} ${complex ? part : ""}`;
      if (this.distributions.has(key)) continue;
      const found = complex ? undefined : this.archivedOf(band);
      this.distributions.set(key, found ?? (await this.sample(band, part, signal)));
    }
  }

  private async sample(band: number, part: Part, signal: AbortSignal): Promise<Distribution> {
    const level = this.pyramid.levels.filter(({ width, height }) => width > 0 && height > 0).at(-1);
    if (!level) throw new RangeError("the pyramid has no pixels to show");
    // Of a coarsest level that is large, its middle.
    const most = Math.floor(Math.sqrt(MOST_SAMPLED));
    const [width, height] = [Math.min(level.width, most), Math.min(level.height, most)];
    const window = { x: (level.width - width) >> 1, y: (level.height - height) >> 1, width, height };
    const { data } = await this.pyramid.readWindow(level.level, window, { bands: [band], signal });
    return sampled(this.type, data, part, this.noData(band, "file"));
  }

  /** The stretch that a band opens with. Its distribution has to be known. */
  usualRange(band: number, part: Part, shown: number): Range {
    if (this.type === "Byte" && shown > 1) return { minimum: 0, maximum: 255 };
    if (isComplex(this.type) && part === "phase") return { minimum: -Math.PI, maximum: Math.PI };
    const distribution = this.distribution(band, part);
    if (!distribution) return rangeOfType(this.type);
    if (distribution.archived) return this.percentiles(distribution, 2, 98);
    return this.ends(band, part) ?? rangeOfType(this.type);
  }

  /** The least and the greatest value of a band, as far as they are known. Its distribution has to be. */
  ends(band: number, part: Part): Range | undefined {
    const { minimum, maximum } = this.metadata.statistics(band) ?? {};
    if (minimum !== undefined && maximum !== undefined && !isComplex(this.type))
      return { minimum: Number(minimum), maximum: Number(maximum) };
    const found = this.distribution(band, part);
    return found && { minimum: found.minimum, maximum: found.maximum };
  }

  percentiles(distribution: Distribution, low: number, high: number): Range {
    return { minimum: percentile(distribution, low), maximum: percentile(distribution, high) };
  }

  /** The style that the file opens with, but for the stretch. */
  usualStyle(): Style {
    const meanings = Array.from({ length: this.bands }, (_, band) => this.told(band).interpretation);
    const colors = ["Red", "Green", "Blue"].map((meaning) => meanings.indexOf(meaning));
    const alpha = meanings.indexOf("Alpha");
    const rest = { ranges: {}, gamma: 1, noData: "file", part: "magnitude" as const, alpha: undefined };
    if (colors.every((band) => band >= 0))
      return { ...rest, bands: colors, colors: "grey", alpha: alpha < 0 ? undefined : alpha };
    // Samples that are no integers are values and no indices, even if the file has colours.
    const palette = !isReal(this.type) && this.palette(0) !== undefined;
    if (this.bands === 2 && alpha === 1) return { ...rest, bands: [0], colors: "grey", alpha };
    if (this.bands >= 3 && !palette) return { ...rest, bands: [0, 1, 2], colors: "grey" };
    return { ...rest, bands: [0], colors: palette ? "palette" : "grey" };
  }

  /**
   * From the pixels of this raster to those of another: by their coordinates where both have some in one system,
   * pixel by pixel where they are of one size, and else so that both fill the same area.
   */
  alignmentTo(other: Raster): Alignment {
    const [a, b] = [this.georeference, other.georeference];
    if (a && b && a.name === b.name) {
      const at = (x: number, y: number): { x: number; y: number } => b.pixel(a.coordinates({ x, y }));
      const [origin, end] = [at(0, 0), at(1, 1)];
      const along = at(1, 0);
      const upright = Math.abs(along.y - origin.y) < 1e-9 * Math.abs(along.x - origin.x);
      const [scaleX, scaleY] = [end.x - origin.x, end.y - origin.y];
      if (upright && scaleX > 0 && scaleY > 0) return { scaleX, scaleY, ...origin };
    }
    if (this.width === other.width && this.height === other.height) return SAME;
    return { scaleX: other.width / this.width, scaleY: other.height / this.height, x: 0, y: 0 };
  }

  async close(): Promise<void> {
    await this.pyramid.close();
  }
}
