// The card with the graph of a line: its ends as numbers, the graph, its values to copy.
import { aligned } from "./camera.js";
import { formatMetres, type Point } from "./coordinates.js";
import { byId, h, short } from "./dom.js";
import type { Line } from "./link.js";
import { messageOf } from "./messages.js";
import { drawProfile, type Profile, profileText, readProfile } from "./profile.js";
import type { Raster } from "./raster.js";
import type { Style } from "./style.js";

const ENDS = [
  ["x0", "Start column"],
  ["y0", "Start row"],
  ["x1", "End column"],
  ["y1", "End row"],
] as const;

export class ProfileCard {
  /** Whether a drag across the picture draws a line. */
  drawing = false;
  /** Where a line was begun by the keyboard. */
  start: Point | undefined;
  private readonly card = byId("profile");
  private readonly graph = h("div", { class: "result" });
  private readonly fields: HTMLInputElement[];
  private abort = new AbortController();
  private profile: Profile | undefined;

  constructor(
    change: (line: Line) => void,
    close: () => void,
    private readonly tell: (text: string) => void,
  ) {
    this.fields = ENDS.map(([, label]) =>
      h("input", { type: "number", step: "any", "aria-label": label, title: label, onchange: () => take() }),
    );
    const take = (): void => {
      const [x0, y0, x1, y1] = this.fields.map((field) => field.valueAsNumber) as [number, number, number, number];
      if ([x0, y0, x1, y1].every(Number.isFinite)) change({ x0, y0, x1, y1 });
    };
    const [x0, y0, x1, y1] = this.fields as [HTMLInputElement, HTMLInputElement, HTMLInputElement, HTMLInputElement];
    this.card.append(
      h(
        "div",
        { class: "head" },
        h("h2", {}, "Along a line"),
        h("span", { class: "ends" }, x0, y0, h("span", { "aria-hidden": "true" }, "→"), x1, y1),
        h("button", { type: "button", class: "quiet", onclick: () => void this.copy() }, "Copy values"),
        h("button", { type: "button", class: "quiet", "aria-label": "Close the graph", onclick: close }, "✕"),
      ),
      this.graph,
    );
  }

  /** Shows the card, and how a line is drawn if there is none. */
  open(line: Line | undefined): void {
    this.card.hidden = false;
    this.start = undefined;
    if (!line) this.say("Drag across the picture, or press Enter at the start and at the end.");
  }

  clear(): void {
    this.abort.abort();
    this.profile = undefined;
    this.start = undefined;
    this.card.hidden = !this.drawing;
    for (const field of this.fields) field.value = "";
    if (this.drawing) this.open(undefined);
    else this.graph.replaceChildren();
  }

  private say(text: string): void {
    this.graph.replaceChildren(h("p", { class: "note" }, text));
  }

  /** Reads and draws the samples of a raster along a line, whose ends are in pixels of the main one. */
  async read(raster: Raster, line: Line, style: Style, main: Raster): Promise<void> {
    this.card.hidden = false;
    ENDS.forEach(([key], i) => ((this.fields[i] as HTMLInputElement).value = String(Number(line[key].toFixed(2)))));
    this.abort.abort();
    this.abort = new AbortController();
    const { signal } = this.abort;
    try {
      const profile = await readProfile(raster, raster === main ? line : moved(line, main, raster), style, signal);
      if (signal.aborted) return;
      this.profile = profile;
      this.graph.replaceChildren(drawProfile(profile, raster, lengthOf(line, main)));
    } catch (error) {
      if (!signal.aborted) this.say(messageOf(error).detail);
    }
  }

  private async copy(): Promise<void> {
    if (!this.profile) return;
    try {
      await navigator.clipboard.writeText(profileText(this.profile));
      this.tell("Values copied");
    } catch {
      this.tell("The browser does not let this page copy");
    }
  }
}

function moved(line: Line, from: Raster, to: Raster): Line {
  const place = aligned({ left: 0, top: 0, scaleX: 1, scaleY: 1 }, from.alignmentTo(to));
  const at = (x: number, y: number): [number, number] => [
    (x - place.left) / place.scaleX,
    (y - place.top) / place.scaleY,
  ];
  const [[x0, y0], [x1, y1]] = [at(line.x0, line.y0), at(line.x1, line.y1)];
  return { x0, y0, x1, y1 };
}

function lengthOf({ x0, y0, x1, y1 }: Line, { georeference }: Raster): string {
  const metres = georeference?.metres({ x: x0, y: y0 }, { x: x1, y: y1 });
  return metres === undefined ? `${short(Math.hypot(x1 - x0, y1 - y0), 4)} pixels` : formatMetres(metres);
}
