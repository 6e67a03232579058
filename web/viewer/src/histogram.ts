// A drawing of how values are spread, with a handle for each end of the stretch. The handles are sliders to the
// keyboard and to screen readers.
import type { Distribution } from "./distribution.js";
import { h, s, short } from "./dom.js";
import type { Range } from "./style.js";

const WIDTH = 256;
const HEIGHT = 64;
const STEPS = 200; // that a handle makes from one end to the other

type End = keyof Range;

export class HistogramView {
  readonly element: HTMLElement;
  private readonly bars = s("path", { class: "bars" });
  private readonly outside = [s("rect", { class: "outside" }), s("rect", { class: "outside" })];
  private readonly handles: Record<End, HTMLElement>;
  private readonly fields: Record<End, HTMLInputElement>;
  private distribution: Distribution | undefined;
  private range: Range = { minimum: 0, maximum: 1 };
  private shown: Range = { minimum: 0, maximum: 1 }; // from the left edge to the right one
  private readonly note = h("p", { class: "note" });

  /** @param change Is called with the range as a handle or a number changes it. */
  constructor(
    private readonly name: string,
    tone: string,
    private readonly whole: boolean,
    private readonly change: (range: Range) => void,
  ) {
    const drawing = s(
      "svg",
      { viewBox: `0 0 ${WIDTH} ${HEIGHT}`, preserveAspectRatio: "none", class: "histogram", "aria-hidden": "true" },
      this.bars,
      ...this.outside,
    );
    this.handles = { minimum: this.handle("minimum"), maximum: this.handle("maximum") };
    this.fields = { minimum: this.field("minimum"), maximum: this.field("maximum") };
    this.element = h(
      "div",
      { class: `distribution ${tone}`, role: "group", "aria-label": `Stretch of ${name}` },
      h("p", { class: "name" }, name),
      h("div", { class: "plot" }, drawing, this.handles.minimum, this.handles.maximum),
      h("div", { class: "ends" }, this.fields.minimum, this.fields.maximum),
      this.note,
    );
  }

  private handle(end: End): HTMLElement {
    const handle = h("div", {
      class: `handle ${end}`,
      role: "slider",
      tabindex: 0,
      "aria-label": `${end === "minimum" ? "Minimum" : "Maximum"} of ${this.name}`,
      "aria-orientation": "horizontal",
    });
    handle.addEventListener("keydown", (event) => this.press(event, end));
    handle.addEventListener("pointerdown", (event) => {
      handle.setPointerCapture(event.pointerId);
      handle.focus();
      event.preventDefault();
    });
    handle.addEventListener("pointermove", (event) => {
      if (!handle.hasPointerCapture(event.pointerId)) return;
      const { left, width } = (handle.parentElement as HTMLElement).getBoundingClientRect();
      this.move(end, this.valueAt((event.clientX - left) / width));
    });
    return handle;
  }

  private field(end: End): HTMLInputElement {
    const field = h("input", {
      type: "number",
      step: "any",
      "aria-label": `${end === "minimum" ? "Minimum" : "Maximum"} of ${this.name}, as a number`,
      onchange: () => {
        const value = field.valueAsNumber;
        if (Number.isFinite(value)) this.take({ ...this.range, [end]: value });
        else this.refresh();
      },
    });
    return field;
  }

  private press(event: KeyboardEvent, end: End): void {
    const { minimum, maximum } = this.shown;
    const fine = (maximum - minimum) / STEPS;
    const step = this.whole ? Math.max(Math.round(fine), 1) : fine;
    const now = this.range[end];
    const to = {
      ArrowLeft: now - step,
      ArrowDown: now - step,
      ArrowRight: now + step,
      ArrowUp: now + step,
      PageDown: now - 10 * step,
      PageUp: now + 10 * step,
      Home: minimum,
      End: maximum,
    }[event.key];
    if (to === undefined) return;
    event.preventDefault();
    this.move(end, to);
  }

  // A handle stays on its side of the other one, and within the drawing.
  private move(end: End, to: number): void {
    const { minimum, maximum } = this.range;
    const [least, most] = end === "minimum" ? [this.shown.minimum, maximum] : [minimum, this.shown.maximum];
    const value = Math.min(Math.max(this.whole ? Math.round(to) : to, least), most);
    this.take({ ...this.range, [end]: value });
  }

  private take(range: Range): void {
    this.range = range;
    this.refresh();
    this.change(range);
  }

  private valueAt(share: number): number {
    return this.shown.minimum + share * (this.shown.maximum - this.shown.minimum);
  }

  private shareOf(value: number): number {
    const { minimum, maximum } = this.shown;
    return maximum > minimum ? Math.min(Math.max((value - minimum) / (maximum - minimum), 0), 1) : 0;
  }

  /** Shows another distribution or stretch. */
  show(distribution: Distribution | undefined, range: Range): void {
    this.range = range;
    const ends = [range.minimum, range.maximum];
    if (distribution) ends.push(distribution.minimum, distribution.maximum);
    this.shown = { minimum: Math.min(...ends), maximum: Math.max(...ends) };
    if (this.distribution !== distribution || !this.bars.hasAttribute("d")) this.distribution = distribution;
    this.draw();
    this.refresh();
  }

  private draw(): void {
    const { distribution } = this;
    const source = distribution?.archived ? "" : distribution ? "From the coarsest level." : "";
    this.note.textContent = source;
    this.note.hidden = !source;
    if (!distribution) return this.bars.setAttribute("d", "");
    const { counts, minimum, binSize } = distribution;
    // By the root, and with a few frequent values cut, so that rare ones show beside them.
    const sorted = counts.filter((count) => count > 0).sort();
    const most = 1.15 * Math.sqrt(sorted[Math.ceil(0.97 * sorted.length) - 1] ?? 1);
    const columns = new Float64Array(WIDTH);
    counts.forEach((count, bin) => {
      const from = Math.floor(this.shareOf(minimum + bin * binSize) * (WIDTH - 1));
      const to = Math.max(Math.ceil(this.shareOf(minimum + (bin + 1) * binSize) * (WIDTH - 1)), from + 1);
      for (let x = from; x < to; ++x) columns[x] = Math.max(columns[x] as number, Math.min(Math.sqrt(count) / most, 1));
    });
    const tops = [...columns].map((share, x) => `V${(HEIGHT - share * (HEIGHT - 2)).toFixed(1)}H${x + 1}`);
    this.bars.setAttribute("d", `M0,${HEIGHT}${tops.join("")}V${HEIGHT}Z`);
  }

  private refresh(): void {
    const [from, to] = [this.shareOf(this.range.minimum), this.shareOf(this.range.maximum)];
    const [low, high] = [Math.min(from, to), Math.max(from, to)];
    for (const end of ["minimum", "maximum"] as const) {
      const value = this.range[end];
      this.fields[end].value = String(Number(value.toPrecision(9)));
      const handle = this.handles[end];
      handle.style.left = `${100 * this.shareOf(value)}%`;
      handle.setAttribute("aria-valuenow", String(value));
      handle.setAttribute("aria-valuetext", short(value));
      const other = this.range[end === "minimum" ? "maximum" : "minimum"];
      const [least, most] = end === "minimum" ? [this.shown.minimum, other] : [other, this.shown.maximum];
      handle.setAttribute("aria-valuemin", String(Math.min(least, value)));
      handle.setAttribute("aria-valuemax", String(Math.max(most, value)));
    }
    const [left, right] = this.outside as [SVGElement, SVGElement];
    for (const [rect, x, width] of [
      [left, 0, low * WIDTH],
      [right, high * WIDTH, (1 - high) * WIDTH],
    ] as const) {
      rect.setAttribute("x", String(x));
      rect.setAttribute("y", "0");
      rect.setAttribute("width", String(width));
      rect.setAttribute("height", String(HEIGHT));
    }
  }
}
