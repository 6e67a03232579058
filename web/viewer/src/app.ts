// The viewer: the state of the view, and what changes it.
import { Address } from "./address.js";
import { aligned, levelFor, type Placement, toPixel } from "./camera.js";
import { type Point } from "./coordinates.js";
import { byId, h } from "./dom.js";
import { type Gestures, listen } from "./gestures.js";
import type { FirstPicture } from "./first.js";
import { asked, type Line, readLink, type State, writeLink } from "./link.js";
import { Notices } from "./notices.js";
import { chosen, opener } from "./opener.js";
import { listenToSplit, Overlay } from "./overlay.js";
import { Pace } from "./pace.js";
import { showPanel } from "./panel.js";
import { ProfileCard } from "./profilecard.js";
import { type Origin, originOf } from "./raster.js";
import { Readout } from "./readout.js";
import { type Layer, Renderer } from "./renderer.js";
import { Side } from "./side.js";
import { Start } from "./start.js";
import type { Style } from "./style.js";
import { Viewport } from "./viewport.js";

const PAN = 80; // pixels of the page that an arrow key moves by

export class App implements Gestures {
  private readonly map = byId("map");
  private readonly renderer: Renderer;
  private readonly overlay = new Overlay();
  private readonly readout = new Readout();
  private readonly profile: ProfileCard;
  private sides: Side[] = [];
  private active: 0 | 1 = 0;
  private readonly viewport: Viewport;
  private readonly notices = new Notices(
    () => void this.retry(),
    () => this.chooseFile(),
  );
  private readonly address = new Address(() =>
    this.sides.length && !this.viewport.moving ? writeLink(this.state()) : undefined,
  );
  private readonly pace = new Pace(() => this.draw());
  private readonly start = new Start((origin) => void this.open(origin));
  private swipe: number | undefined;
  private line: Line | undefined;
  private plain = false;
  private pointer: Point | undefined;
  private byKeys = false;
  private frameAsked = false;
  private stale = false; // the picture itself, not only what lies over it
  private saidTimer = 0;

  /** Settles once the graphics processor is started; rejects where there is none. */
  readonly begun: Promise<WebGL2RenderingContext>;

  /**
   * @param first What the server made of the first view, which is on the screen or will not be.
   * @throws Error where the browser has no WebGL 2, and there is no first picture to be waited for.
   */
  constructor(private first?: FirstPicture) {
    this.renderer = new Renderer(byId<HTMLCanvasElement>("picture"));
    this.begun = first
      ? first.over.then(breath).then(() => this.startDrawing())
      : Promise.resolve(this.renderer.begin());
    this.viewport = new Viewport(
      () => this.sides[0]?.raster,
      () => this.renderer.size,
      () => this.moved(),
    );
    this.profile = new ProfileCard(
      (line) => this.setLine(line),
      () => this.drawLine(false),
      (text) => this.notices.note(text),
    );
    this.listen();
    if (first) this.cover();
    void this.apply(asked());
  }

  private listen(): void {
    listen(this.map, this);
    listenToSplit(
      (share) => this.setSwipe(share),
      () => this.swipe ?? 0.5,
    );
    addEventListener("popstate", () => void this.apply(readLink(location.hash)));
    new ResizeObserver(() => this.resized()).observe(this.map);
    const { canvas } = this.renderer;
    canvas.addEventListener("webglcontextlost", (event) => event.preventDefault());
    canvas.addEventListener("webglcontextrestored", () => {
      this.renderer.reset();
      for (const { store } of this.sides) store?.clear(false);
      this.draw();
    });
    this.map.addEventListener("focus", () => this.keyboard(this.map.matches(":focus-visible")));
    this.map.addEventListener("blur", () => this.keyboard(false));
    this.listenToButtons();
    this.listenToDrops();
  }

  private startDrawing(): WebGL2RenderingContext {
    if (this.first && !this.first.image) this.uncover();
    return this.renderer.begin();
  }

  // Until the view is drawn, its first picture is all that is seen: what comes piece by piece would be less. Whoever
  // moves something sees the samples at once.
  private cover(): void {
    this.renderer.canvas.style.visibility = "hidden";
    const end = (): void => {
      if (this.first) this.uncover();
    };
    for (const kind of ["pointerdown", "wheel", "keydown", "popstate", "drop"])
      addEventListener(kind, end, { capture: true, once: true, passive: true });
  }

  private listenToButtons(): void {
    const click = (id: string, act: () => void): void => byId(id).addEventListener("click", act);
    byId("home").addEventListener("click", (event) => {
      if (event.ctrlKey || event.metaKey || event.shiftKey || event.altKey) return;
      event.preventDefault();
      this.goHome();
    });
    click("open", () => this.chooseFile());
    click("compare", () => this.compare(this.sides.length < 2));
    click("draw-line", () => this.drawLine(!this.profile.drawing));
    click("copy-link", () => void this.copyLink());
    click("save", () => this.save());
    click("show-panel", () => this.togglePanel());
    click("help", () => byId<HTMLDialogElement>("help-dialog").showModal());
    click("zoom-in", () => this.viewport.zoom(2, undefined, true));
    click("zoom-out", () => this.viewport.zoom(0.5, undefined, true));
    click("zoom-fit", () => this.viewport.fit());
    click("zoom-one", () => this.viewport.zoomTo(1));
    for (const dialog of document.querySelectorAll("dialog"))
      dialog.addEventListener("click", (event) => {
        if (event.target === dialog || (event.target as Element).closest("[data-close]")) dialog.close();
      });
  }

  private listenToDrops(): void {
    addEventListener("dragover", (event) => {
      event.preventDefault();
      document.body.classList.add("dropping");
    });
    addEventListener("dragleave", (event) => {
      if (!event.relatedTarget) document.body.classList.remove("dropping");
    });
    addEventListener("drop", (event) => {
      event.preventDefault();
      document.body.classList.remove("dropping");
      const origin = chosen([...(event.dataTransfer?.files ?? [])]);
      if (origin) void this.open(origin);
    });
  }

  // --- files

  /** Shows a state as a link tells it; files that are open already stay so. */
  private async apply(state: State): Promise<void> {
    this.address.forget();
    this.plain = state.background === "plain";
    this.swipe = state.sides.length === 2 ? (state.swipe ?? 0.5) : undefined;
    this.active = 0;
    const before = this.sides;
    const opening: Promise<void>[] = [];
    this.sides = state.sides.map(({ file, local, style = {} }) => {
      const known = before.find(({ origin, error }) => !error && isSame(origin, file, local));
      const origin = known?.origin ?? (file === undefined ? { name: local ?? "" } : this.originFor(file));
      const side = this.newSide(origin);
      opening.push(this.begin(side, style, known));
      return side;
    });
    for (const side of before) side.close(this.sides.some(({ origin }) => origin === side.origin));
    this.viewport.set(state.view && { ...state.view, zoom: state.view.zoom * devicePixelRatio });
    this.line = state.line;
    this.profile.drawing = false;
    this.profile.clear();
    this.map.classList.remove("drawing");
    byId("draw-line").setAttribute("aria-pressed", String(this.line !== undefined));
    this.show();
    await Promise.all(opening);
    this.opened();
  }

  /** Lets go of all files: a step to go back by. */
  private goHome(): void {
    if (!this.sides.length) return;
    this.address.write();
    history.pushState(null, "", location.pathname);
    void this.apply({ sides: [] });
  }

  private originFor(file: string): Origin {
    return URL.canParse(file, document.baseURI) ? originOf(file) : { name: file, url: file };
  }

  private newSide(origin: Origin): Side {
    return new Side(
      origin,
      this.begun,
      () => this.draw(),
      () => {
        this.readout.forget();
        this.show();
      },
    );
  }

  private async begin(side: Side, style: Partial<Style>, known?: Side): Promise<void> {
    const { url, file, name } = side.origin;
    if (url === undefined && !file)
      side.error = new Error(`The link shows "${name}", a file on somebody's own disk. Choose it again to see it.`);
    else if (url !== undefined && !URL.canParse(url, document.baseURI)) side.error = new Error("This is no address.");
    else await side.open(style, known?.raster, known);
    void side.known.then(() => this.first && this.refresh());
  }

  /** Opens a file on the side that is chosen, as it is usual for it. */
  async open(origin: Origin): Promise<void> {
    for (const dialog of document.querySelectorAll("dialog")) dialog.close();
    const index = Math.min(this.active, this.sides.length);
    const old = this.sides[index];
    const side = this.newSide(origin);
    this.sides[index] = side;
    old?.close(this.sides.some(({ raster }) => raster !== undefined && raster === old.raster));
    if (index === 0) {
      this.viewport.set(undefined);
      this.line = undefined;
    }
    this.profile.clear();
    this.show();
    await this.begin(side, {});
    this.opened();
    this.remember(true);
    this.map.focus();
  }

  /** Opens again what could not be opened, or was replaced. */
  private async retry(): Promise<void> {
    const again = this.sides.map((side) => (side.error || side.store?.lost ? side : undefined));
    await Promise.all(
      again.map(async (old, i) => {
        if (!old) return void this.sides[i]?.store?.retry();
        const side = (this.sides[i] = this.newSide(old.origin));
        this.show();
        await this.begin(side, old.style ?? readLink(location.hash).sides[i]?.style ?? {});
        old.close(this.sides.some(({ raster }) => raster !== undefined && raster === old.raster));
      }),
    );
    this.opened();
  }

  private opened(): void {
    const main = this.sides[0]?.raster;
    if (main && !this.viewport.view) this.viewport.fit();
    this.show();
    this.remember(false);
    if (this.line) this.readLine();
    void this.idle(false)
      .then(shown)
      .then(() => this.warm());
  }

  // What was drawn last has to be drawn once more, or the page would show nothing.
  private warm(): void {
    const { placement } = this.viewport;
    if (!placement) return;
    this.renderer.warm(this.layers(), placement);
    this.frame();
  }

  private chooseFile(): void {
    const dialog = byId<HTMLDialogElement>("open-dialog");
    dialog.querySelector(".opener")?.remove();
    dialog.append(opener((origin) => void this.open(origin)));
    dialog.showModal();
  }

  private compare(on: boolean): void {
    const [first, second] = this.sides;
    if (!first?.raster || !first.style) return;
    if (!on) {
      this.active = 0;
      this.sides = [first];
      second?.close(second.raster === first.raster);
      this.swipe = undefined;
    } else {
      const side = this.newSide(first.origin);
      this.sides = [first, side];
      [this.swipe, this.active] = [0.5, 1];
      void side.open(structuredClone(first.style), first.raster).then(() => this.show());
    }
    this.show();
    this.remember(true);
    this.notices.say(on ? "Two sides. The right one is chosen." : "One side.");
  }

  // --- the page around the picture

  /** Brings all that is not the picture itself up to what is open. */
  private show(): void {
    const main = this.sides[0];
    const side = this.sides[this.active] ?? main;
    const shown = main?.raster !== undefined;
    document.body.classList.toggle("empty", !this.sides.length);
    this.map.classList.toggle("chequers", !this.plain);
    document.title = main ? `${main.origin.name} – zmcraster` : "zmcraster";
    byId("title").textContent = [...new Set(this.sides.map(({ origin }) => origin.name))].join(" · ");
    document.body.classList.toggle(
      "bare",
      this.sides.every(({ error }) => error),
    );
    for (const id of ["compare", "draw-line", "copy-link", "save", "zoom-in", "zoom-out", "zoom-fit", "zoom-one"])
      byId<HTMLButtonElement>(id).disabled = !shown;
    byId("compare").setAttribute("aria-pressed", String(this.sides.length === 2));
    byId("scale").hidden = !shown;
    this.start.show(!this.sides.length);
    const panel = byId("controls");
    if (side?.raster && side.style) this.showControls(panel, side);
    else panel.replaceChildren();
    this.notices.show(this.sides);
    this.draw();
  }

  private showControls(panel: HTMLElement, side: Side): void {
    const { raster, style } = side;
    if (!raster || !style) return;
    showPanel(panel, {
      raster,
      style,
      side: this.sides.length === 2 ? this.active : undefined,
      plain: this.plain,
      change: (next, structure) => void this.restyle(side, next, structure),
      chooseSide: (active) => {
        this.active = active;
        this.show();
      },
      chooseFile: () => this.chooseFile(),
      choosePlain: (plain) => {
        this.plain = plain;
        this.show();
        this.remember(true);
      },
    });
  }

  private async restyle(side: Side, style: Style, structure: boolean): Promise<void> {
    if (structure) await side.restyle(style);
    else {
      side.style = style;
      this.pace.changed();
    }
    if (structure) this.show();
    this.draw();
    this.remember(true);
    if (structure && this.line) this.readLine();
  }

  private togglePanel(): void {
    const hide = this.panelShown();
    document.body.classList.toggle("no-panel", hide);
    document.body.classList.toggle("with-panel", !hide);
    byId("show-panel").setAttribute("aria-expanded", String(this.panelShown()));
  }

  private panelShown(): boolean {
    return getComputedStyle(byId("panel")).display !== "none";
  }

  private async copyLink(): Promise<void> {
    this.writeLink();
    try {
      await navigator.clipboard.writeText(location.href);
      this.notices.note("Link copied");
    } catch {
      this.notices.note("The link is in the address bar");
    }
  }

  private save(): void {
    this.frame();
    this.renderer.canvas.toBlob((blob) => {
      if (!blob) return;
      const href = URL.createObjectURL(blob);
      h("a", { href, download: `${this.sides[0]?.origin.name ?? "picture"}.png` }).click();
      setTimeout(() => URL.revokeObjectURL(href), 60000);
    });
  }

  // --- the view

  private resized(): void {
    const { width, height } = this.map.getBoundingClientRect();
    const size = { width: Math.round(width * devicePixelRatio), height: Math.round(height * devicePixelRatio) };
    const before = this.renderer.size;
    if (this.first && JSON.stringify(size) !== JSON.stringify(this.first.screen)) this.uncover();
    const whole = !this.viewport.view || this.viewport.isFitting(before);
    this.renderer.resize(size);
    if (whole) this.viewport.fit();
    byId("show-panel").setAttribute("aria-expanded", String(this.panelShown()));
    this.draw();
  }

  pan(dx: number, dy: number): void {
    this.viewport.pan(dx, dy);
  }

  zoom(factor: number, at: Point | undefined, smooth: boolean): void {
    this.viewport.zoom(factor, at, smooth);
  }

  private moved(): void {
    this.draw();
    this.remember(false);
  }

  settled(): void {
    this.remember(false);
  }

  // --- pictures

  /** Asks for a new picture. */
  draw(): void {
    this.stale = true;
    this.refresh();
  }

  // Asks for what lies over the picture to be brought up to date, which leaves the picture as it is.
  private refresh(): void {
    if (this.frameAsked) return;
    this.frameAsked = true;
    requestAnimationFrame(() => {
      this.frameAsked = false;
      this.viewport.approach();
      if (this.stale) this.frame(this.pace.coarse ? 2 : 1);
      else this.showOverlay();
      if (this.first && this.isWhole()) this.uncover();
      this.notices.show(this.sides);
    });
  }

  private layers(): Layer[] {
    const { width } = this.renderer.size;
    const main = this.sides[0]?.raster;
    const at = this.swipe === undefined ? width : Math.round(this.swipe * width);
    const layers = this.sides.map((side, i) => side.layer(i ? at : 0, i ? width : at, main));
    return layers.filter((layer) => layer !== undefined && layer.to > layer.from) as Layer[];
  }

  private frame(grain: 1 | 2 = 1): void {
    const { renderer, pace } = this;
    const { placement } = this.viewport;
    const start = performance.now();
    this.stale = false;
    if (renderer.begun)
      renderer.draw(placement ? this.layers() : [], placement ?? NOWHERE, !this.viewport.moving, grain);
    // Tiles that arrive take time of their own.
    if (grain === 1 && this.isWhole()) void renderer.done(start).then((milliseconds) => (pace.took = milliseconds));
    this.showOverlay();
  }

  // Whether all that belongs to the view is here: what a sidecar tells of colours, and the tiles, which are drawn then.
  private isWhole(): boolean {
    const { view } = this.viewport;
    return this.sides.every(
      ({ raster, store, error, complete }) =>
        error !== undefined || (raster && view && complete && !store?.state.pending),
    );
  }

  // The samples take the place of the first picture. It stays below them until they are on the screen.
  private uncover(): void {
    const { first } = this;
    this.first = undefined;
    this.renderer.canvas.style.visibility = "";
    document.body.classList.remove("alone");
    void shown().then(() => first?.end());
  }

  private showOverlay(): void {
    const { placement } = this.viewport;
    const main = this.sides[0]?.raster;
    this.overlay.showSplit(placement && main ? this.swipe : undefined);
    const { onPage: page, middle, view } = this.viewport;
    this.overlay.showLine(main && page ? this.line : undefined, page ?? NOWHERE);
    this.overlay.showCross(main && this.byKeys ? middle : undefined);
    if (main && page) this.overlay.scale(main, page, middle);
    byId("zoom-level").textContent = main && view ? zoomText(view.zoom) : "";
    this.showReadout();
  }

  private showReadout(): void {
    const { placement } = this.viewport;
    const at = this.pointer ?? (this.byKeys ? this.viewport.middle : undefined);
    const right = at && this.swipe !== undefined && at.x * devicePixelRatio >= this.swipe * this.renderer.size.width;
    const side = this.sides[right ? 1 : 0];
    const layer = side?.layer(0, 1, this.sides[0]?.raster);
    if (this.viewport.moving) return; // each place on the way would ask for a tile
    if (!placement || !at || !layer) return this.readout.show(side?.raster, undefined, undefined);
    const own = layer.raster === this.sides[0]?.raster ? placement : aligned(placement, layer.alignment);
    const point = toPixel(own, { x: at.x * devicePixelRatio, y: at.y * devicePixelRatio });
    this.readout.show(layer.raster, point, levelFor(layer.raster.pyramid.levels, own));
  }

  point(at: Point | undefined): void {
    this.pointer = at;
    if (at) this.byKeys = false;
    this.refresh();
  }

  private keyboard(on: boolean): void {
    this.byKeys = on;
    this.refresh();
  }

  // --- the line

  drawing(): boolean {
    return this.profile.drawing;
  }

  private drawLine(on: boolean): void {
    this.profile.drawing = on;
    this.map.classList.toggle("drawing", on);
    byId("draw-line").setAttribute("aria-pressed", String(on || this.line !== undefined));
    if (!on) this.setLine(undefined);
    else {
      this.profile.open(this.line);
      this.notices.say("Drag across the picture, or press Enter at the start and at the end of the line.");
    }
  }

  /** A line between two places of the page, drawn by the pointer. */
  drag(from: Point, to: Point, done: boolean): void {
    const line = this.lineBetween(from, to);
    if (!line) return;
    if (done) this.setLine(line);
    else {
      this.line = line;
      this.draw();
    }
  }

  private lineBetween(from: Point, to: Point): Line | undefined {
    const page = this.viewport.onPage;
    if (!page) return undefined;
    const [a, b] = [toPixel(page, from), toPixel(page, to)];
    return { x0: a.x, y0: a.y, x1: b.x, y1: b.y };
  }

  private setLine(line: Line | undefined): void {
    this.line = line;
    if (line) this.readLine();
    else this.profile.clear();
    this.draw();
    this.remember(true);
  }

  private readLine(): void {
    const side = this.sides[this.active] ?? this.sides[0];
    const main = this.sides[0]?.raster;
    if (this.line && side?.raster && side.style && main) {
      byId("draw-line").setAttribute("aria-pressed", "true");
      this.profile.read(side.raster, this.line, side.style, main);
    }
  }

  // --- keys

  key(event: KeyboardEvent): boolean {
    if (!this.sides[0]?.raster) return event.key.toLowerCase() === "o" && (this.chooseFile(), true);
    const step = event.shiftKey ? 1 / devicePixelRatio : PAN;
    const { view } = this.viewport;
    const one = event.shiftKey && view ? Math.max(view.zoom, 1) * step : step;
    const keys: Record<string, () => void> = {
      ArrowLeft: () => this.viewport.pan(one, 0),
      ArrowRight: () => this.viewport.pan(-one, 0),
      ArrowUp: () => this.viewport.pan(0, one),
      ArrowDown: () => this.viewport.pan(0, -one),
      "+": () => this.viewport.zoom(2, undefined, true),
      "=": () => this.viewport.zoom(2, undefined, true),
      "-": () => this.viewport.zoom(0.5, undefined, true),
      "0": () => this.viewport.fit(),
      Home: () => this.viewport.fit(),
      "1": () => this.viewport.zoomTo(1),
      o: () => this.chooseFile(),
      c: () => this.compare(this.sides.length < 2),
      l: () => this.drawLine(!(this.profile.drawing || this.line)),
      b: () => this.togglePanel(),
      v: () => this.tellSoon(0),
      "?": () => byId<HTMLDialogElement>("help-dialog").showModal(),
      Enter: () => this.mark(),
      Escape: () => this.drawLine(false),
    };
    const act = keys[event.key.length === 1 ? event.key.toLowerCase() : event.key];
    if (!act) return false;
    if (event.key === "Enter" && !this.profile.drawing) return false;
    this.keyboard(true);
    act();
    if (event.key.startsWith("Arrow")) this.tellSoon();
    return true;
  }

  // What is under the cross, once it has come to rest, is drawn there, and its samples are here.
  private tellSoon(milliseconds = 600): void {
    clearTimeout(this.saidTimer);
    this.saidTimer = window.setTimeout(() => {
      if (this.frameAsked || this.viewport.moving || this.readout.pending) this.tellSoon(50);
      else this.notices.say(this.readout.text);
    }, milliseconds);
  }

  // The start of a line at the cross, then its end.
  private mark(): void {
    const at = this.lineBetween(this.viewport.middle, this.viewport.middle);
    if (!at) return;
    const start = this.profile.start;
    this.profile.start = start ? undefined : { x: at.x0, y: at.y0 };
    this.setLine(start ? { x0: start.x, y0: start.y, x1: at.x0, y1: at.y0 } : at);
    this.notices.say(start ? "The line ends here." : "The line starts here. Move on, and press Enter at its end.");
  }

  private setSwipe(share: number): void {
    this.swipe = share;
    this.draw();
    this.remember(false);
  }

  // --- the link

  private remember(push: boolean): void {
    this.address.remember(push);
  }

  /** Writes the link at once. */
  writeLink(): void {
    this.address.write();
  }

  private state(): State {
    const { view } = this.viewport;
    const sides = this.sides.map(({ origin, style }, i) => ({
      ...(origin.url === undefined ? { local: origin.name } : { file: origin.url }),
      style: style ?? readLink(location.hash).sides[i]?.style ?? {},
    }));
    return {
      sides,
      ...(view && { view: { ...view, zoom: view.zoom / devicePixelRatio } }),
      ...(this.swipe !== undefined && { swipe: this.swipe }),
      ...(this.line && { line: this.line }),
      ...(this.plain && { background: "plain" as const }),
    };
  }

  // --- for those who look at pictures

  /** Once all that is in view is here, and drawn, with `sidecars` also by what these tell. */
  async idle(sidecars = true): Promise<void> {
    const waits = (): boolean =>
      this.frameAsked ||
      this.viewport.moving ||
      this.first !== undefined ||
      this.pace.coarse ||
      this.sides.some(
        ({ raster, complete, error, store }) =>
          (!(sidecars ? complete : raster) && !error) || (store?.state.pending ?? 0) > 0,
      );
    do await new Promise((resolve) => setTimeout(resolve, 10));
    while (waits());
  }

  /** The picture as it is, row by row from the top: red, green, blue, alpha. */
  picture(): { width: number; height: number; pixels: Uint8Array } {
    this.frame();
    return { ...this.renderer.size, pixels: this.renderer.pixels() };
  }

  /**
   * Milliseconds that a picture takes, until the graphics processor is done: in all its pixels, or with a `grain` of 2 as
   * just behind a change of style where all take too long.
   */
  time(grain: 1 | 2 = 1): number {
    const start = performance.now();
    this.frame(grain);
    this.renderer.finish();
    return performance.now() - start;
  }
}

// Once what was just asked for is on its way.
const breath = (): Promise<void> => new Promise((resolve) => setTimeout(resolve));

// Once what was drawn last is on the screen.
const shown = async (): Promise<void> => {
  for (let frames = 0; frames < 3; ++frames) await new Promise((resolve) => requestAnimationFrame(resolve));
};

const NOWHERE: Placement = { left: 0, top: 0, scaleX: 1, scaleY: 1 };

const isSame = ({ url, file, name }: Origin, otherUrl?: string, otherName?: string): boolean =>
  otherUrl === undefined ? file !== undefined && name === otherName : url === otherUrl;

function zoomText(zoom: number): string {
  const per = zoom >= 1 ? zoom : 1 / zoom;
  const text = String(Number(per.toPrecision(3)));
  return zoom >= 1 ? `${text} : 1` : `1 : ${text}`;
}
