// The page while no file is open: the files of the server with their pictures, where it tells them, and the other ways
// to open one.
import { byId, h } from "./dom.js";
import { gallery, offered } from "./gallery.js";
import { opener } from "./opener.js";
import type { Origin } from "./raster.js";

export class Start {
  private readonly page = byId("welcome");
  private shown = false;
  private end: () => void = () => {};

  constructor(private readonly open: (origin: Origin) => void) {}

  /** Shows it or not. The list of the server is asked for each time that it comes. */
  show(on: boolean): void {
    if (on === this.shown) return;
    this.shown = on;
    this.page.hidden = !on;
    this.end();
    this.end = () => {};
    this.page.replaceChildren();
    if (on) void this.fill();
  }

  private async fill(): Promise<void> {
    const listing = await offered();
    if (!this.shown || this.page.hasChildNodes()) return;
    if (!listing) return void this.page.append(this.card());
    const { element, end } = gallery(listing, this.open);
    this.end = end;
    this.page.append(element, h("details", { class: "elsewhere" }, h("summary", {}, "Open another file"), this.form()));
  }

  private card(): HTMLElement {
    return h("div", { class: "card message" }, h("h2", {}, "Open a pyramid file"), ...this.form().childNodes);
  }

  private form(): HTMLElement {
    const note =
      "From this computer or from any web server. Nothing is sent anywhere: the file is read in pieces, as they come into view.";
    return h("div", {}, h("p", { class: "note" }, note), opener(this.open, false));
  }
}
