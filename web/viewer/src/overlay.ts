// What lies over the picture: scale bar, cross, the line of the graph, the slider between two sides.
import { type Placement, toPixel, toScreen } from "./camera.js";
import { formatMetres, type Point, roundLength } from "./coordinates.js";
import { byId } from "./dom.js";
import type { Line } from "./link.js";
import type { Raster } from "./raster.js";

const LONGEST = 140; // of the scale bar, in pixels of the page

export class Overlay {
  private readonly bar = byId("scale-bar");
  private readonly label = byId("scale-label");
  private readonly cross = byId<SVGElement>("cross");
  private readonly line = byId<SVGElement>("line");
  private readonly ends = [byId<SVGElement>("line-start"), byId<SVGElement>("line-end")];
  private readonly split = byId("split");

  /** The length that the scale bar has, in metres where the raster lies on the earth, and in pixels of level 0. */
  scale(raster: Raster, placement: Placement, middle: Point): void {
    const from = toPixel(placement, { x: middle.x - LONGEST / 2, y: middle.y });
    const to = toPixel(placement, { x: middle.x + LONGEST / 2, y: middle.y });
    const metres = raster.georeference?.metres(from, to);
    const length = metres || to.x - from.x;
    const round = roundLength(length);
    this.bar.style.width = `${(LONGEST * round) / length}px`;
    this.label.textContent = metres ? formatMetres(round) : `${round} ${round === 1 ? "pixel" : "pixels"}`;
  }

  /** A cross in the middle, where the keyboard points. */
  showCross(at: Point | undefined): void {
    this.cross.toggleAttribute("hidden", !at);
    if (at) this.cross.setAttribute("transform", `translate(${at.x} ${at.y})`);
  }

  showLine(line: Line | undefined, placement: Placement): void {
    for (const each of [this.line, ...this.ends]) each.toggleAttribute("hidden", !line);
    if (!line) return;
    const a = toScreen(placement, { x: line.x0, y: line.y0 });
    const b = toScreen(placement, { x: line.x1, y: line.y1 });
    this.line.setAttribute("d", `M${a.x},${a.y}L${b.x},${b.y}`);
    [a, b].forEach((at, i) => this.ends[i]?.setAttribute("transform", `translate(${at.x} ${at.y})`));
  }

  showSplit(share: number | undefined): void {
    this.split.hidden = share === undefined;
    if (share === undefined) return;
    this.split.style.left = `${100 * share}%`;
    this.split.setAttribute("aria-valuenow", String(Math.round(100 * share)));
    this.split.setAttribute("aria-valuetext", `${Math.round(100 * share)} per cent`);
  }
}

/** Makes the slider between two sides move by pointer and keys. */
export function listenToSplit(take: (share: number) => void, now: () => number): void {
  const split = byId("split");
  const move = (share: number): void => take(Math.min(Math.max(share, 0), 1));
  split.addEventListener("pointerdown", (event) => {
    split.setPointerCapture(event.pointerId);
    split.focus();
    event.preventDefault();
  });
  split.addEventListener("pointermove", (event) => {
    if (!split.hasPointerCapture(event.pointerId)) return;
    const { left, width } = (split.parentElement as HTMLElement).getBoundingClientRect();
    move((event.clientX - left) / width);
  });
  split.addEventListener("keydown", (event) => {
    const steps: Record<string, number> = { ArrowLeft: -0.02, ArrowDown: -0.02, ArrowRight: 0.02, ArrowUp: 0.02 };
    const ends: Record<string, number> = { Home: 0, End: 1, PageDown: now() - 0.1, PageUp: now() + 0.1 };
    const step = steps[event.key];
    const to = step === undefined ? ends[event.key] : now() + step;
    if (to === undefined) return;
    event.preventDefault();
    move(to);
  });
}
