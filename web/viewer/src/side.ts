// One side of the picture: a file from its opening on, with its style and its tiles.
import { SAME } from "./camera.js";
import { COLOR_MAPS } from "./colormaps.js";
import { type Origin, Raster } from "./raster.js";
import type { Layer } from "./renderer.js";
import type { Style } from "./style.js";
import { TileStore } from "./tiles.js";

export class Side {
  raster: Raster | undefined;
  store: TileStore | undefined;
  style: Style | undefined;
  error: unknown;
  /** Whether nothing is expected any more that would change how the file looks by itself. */
  complete = false;
  /** Settles then. */
  readonly known: Promise<void>;
  private settled: () => void = () => {};
  private readonly abort = new AbortController();

  /** @param changed Is called when there is something new to draw, `restyled` when there is something else to choose. */
  constructor(
    readonly origin: Origin,
    private readonly begun: Promise<WebGL2RenderingContext>,
    private readonly changed: () => void,
    private readonly restyled: () => void,
  ) {
    this.known = new Promise((resolve) => (this.settled = resolve));
  }

  /**
   * Opens the file, or shares that of another side, or takes over all that a side had which is not shown any more.
   * Does not reject: what fails stands in `error`.
   */
  async open(wanted: Partial<Style>, shared?: Raster, before?: Side): Promise<void> {
    const { signal } = this.abort;
    try {
      const raster = shared ?? (await Raster.open(this.origin, signal));
      if (signal.aborted) return void (shared ?? (await raster.close()));
      if (before?.raster === raster) [this.store, before.store] = [before.store, undefined];
      await this.begin(raster, wanted);
      if (!shared) void this.takeSidecar(raster, wanted).finally(() => this.finish());
      else this.finish();
    } catch (error) {
      if (!signal.aborted) this.error = error;
    }
  }

  private finish(): void {
    this.complete = true;
    this.settled();
  }

  private async begin(raster: Raster, wanted: Partial<Style>): Promise<void> {
    const style = fitted(wanted, raster);
    await this.settle(raster, style);
    const gl = await this.begun;
    this.store ??= new TileStore(gl, raster, this.changed);
    this.style = style;
    this.raster = raster;
  }

  // It may name values without data, the meaning of bands, and a place on the earth.
  private async takeSidecar(raster: Raster, wanted: Partial<Style>): Promise<void> {
    const begun = this.style;
    if (!(await raster.readSidecar(this.abort.signal)) || this.abort.signal.aborted) return;
    if (this.style === begun && !wanted.bands) await this.restyle(fitted({ ...wanted }, raster));
    this.restyled();
  }

  // Gives a stretch to each band that is shown.
  private async settle(raster: Raster, style: Style): Promise<void> {
    const lacking = style.bands.filter((band) => !style.ranges[band]);
    await raster.learn(style.bands, style.part, this.abort.signal);
    const ranges = { ...style.ranges };
    for (const band of lacking) ranges[band] = raster.usualRange(band, style.part, style.bands.length);
    style.ranges = ranges;
  }

  /** Takes a style whose bands may not have been shown yet. */
  async restyle(style: Style): Promise<void> {
    if (!this.raster) return;
    try {
      await this.settle(this.raster, style);
      if (!this.abort.signal.aborted) this.style = style;
    } catch (error) {
      if (!this.abort.signal.aborted) this.error = error;
    }
    this.changed();
  }

  layer(from: number, to: number, main: Raster | undefined): Layer | undefined {
    const { raster, store, style } = this;
    if (!raster || !store || !style) return undefined;
    const alignment = main && main !== raster ? main.alignmentTo(raster) : SAME;
    return { raster, store, style, alignment, from, to };
  }

  /** Ends all that is under way; the file is closed unless another side has it as well. */
  close(keep: boolean): void {
    this.abort.abort();
    this.store?.clear();
    if (!keep) void this.raster?.close();
  }
}

/** A style as a link or another file had it, as far as this file has the bands and colours. */
export function fitted(wanted: Partial<Style>, raster: Raster): Style {
  const usual = raster.usualStyle();
  const has = (band: number | undefined): boolean => band === undefined || band < raster.bands;
  const usable = wanted.bands?.every(has) && has(wanted.alpha);
  const given = Object.fromEntries(Object.entries(wanted).filter(([, value]) => value !== undefined)) as Partial<Style>;
  if (!usable) for (const key of ["bands", "alpha", "ranges", "colors"] as const) delete given[key];
  const style = { ...usual, ...(usable && { alpha: wanted.alpha }), ...given };
  const known =
    style.colors === "palette"
      ? raster.palette(style.bands[0] as number) !== undefined
      : COLOR_MAPS.has(style.colors.replace(/^-/, ""));
  return { ...style, ranges: { ...style.ranges }, colors: known && style.bands.length === 1 ? style.colors : "grey" };
}
