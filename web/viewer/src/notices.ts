// What the page tells beside the picture: problems with a file, tiles on their way or lost, short notes.
import { byId, h } from "./dom.js";
import { messageOf } from "./messages.js";
import type { Side } from "./side.js";

const NOTE = 2500; // milliseconds that a note stays

export class Notices {
  private timer = 0;

  constructor(
    private readonly retry: () => void,
    private readonly chooseFile: () => void,
  ) {}

  /** Says something to those who listen to the page. */
  say(text: string): void {
    byId("live").textContent = text;
  }

  /** Shows a line for a moment, and says it. */
  note(text: string): void {
    const note = byId("note");
    note.textContent = text;
    note.hidden = false;
    this.say(text);
    clearTimeout(this.timer);
    this.timer = window.setTimeout(() => (note.hidden = true), NOTE);
  }

  /** Brings all that is told of the files up to date. */
  show(sides: readonly Side[]): void {
    const broken = sides.find((side) => side.error ?? side.store?.lost);
    byId("problem").hidden = !broken;
    if (broken) this.showProblem(broken);
    this.showTiles(sides);
  }

  private showProblem({ origin, error, store }: Side): void {
    const { title, detail, advice } = messageOf(error ?? store?.lost);
    const texts = { title, name: origin.name, detail, advice };
    // The same again would be said again.
    const told = JSON.stringify(texts);
    const card = byId("problem");
    if (card.dataset["told"] === told) return;
    card.dataset["told"] = told;
    for (const [part, text] of Object.entries(texts)) byId(`problem-${part}`).textContent = text;
    const again = h("button", { type: "button", class: "primary", onclick: () => this.retry() }, "Try again");
    const other = h("button", { type: "button", onclick: () => this.chooseFile() }, "Open another file");
    byId("problem-actions").replaceChildren(...(origin.url === undefined && !origin.file ? [other] : [again, other]));
  }

  // Tiles on their way, and those that could not be had.
  private showTiles(sides: readonly Side[]): void {
    const states = sides.map(({ store }) => store?.state).filter((state) => state !== undefined);
    const opening = sides.some(({ raster, error }) => !raster && !error);
    const busy = opening || states.some(({ pending }) => pending > 0);
    byId("busy").hidden = !busy;
    byId("map").setAttribute("aria-busy", String(busy));
    const failed = states.reduce((sum, state) => sum + state.failed, 0);
    const toast = byId("failures");
    toast.hidden = !failed || sides.some(({ store }) => store?.lost);
    if (toast.hidden || toast.dataset["count"] === String(failed)) return;
    toast.dataset["count"] = String(failed);
    const reason = states.find((state) => state.reason)?.reason;
    toast.replaceChildren(
      h("span", {}, `${failed} ${failed === 1 ? "tile" : "tiles"} could not be had: ${messageOf(reason).detail}`),
      h("button", { type: "button", onclick: () => this.retry() }, "Try again"),
    );
  }
}
