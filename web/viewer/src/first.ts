// The first picture: what the server's own renderer makes of the view that the link tells, laid where the viewer will
// draw the samples. It is there before the viewer, and before a graphics processor has been started, which takes
// long where there is none. Only the page that the program gives out has this script.
import type { Size } from "./camera.js";
import { byId } from "./dom.js";
import { asked } from "./link.js";
import { takeTheme } from "./theme.js";
import { viewAddress } from "./viewaddress.js";

export interface FirstPicture {
  /** The size of the screen that it is for, in pixels of the screen. */
  readonly screen: Size;
  /** The picture on the page, once it is there. */
  image: HTMLImageElement | undefined;
  /** Does not reject: it is on the screen, or will not be, or is not worth waiting for any more. */
  readonly over: Promise<void>;
  /** Takes it from the page, or sees to it that it does not come any more. */
  end(): void;
}

const PATIENCE = 2000; // milliseconds after which the viewer starts all the same
const PRESENTED = 400; // milliseconds that are waited for the word that it is on the screen

// Once an image is on the screen itself, where the browser tells that.
const presented = (): Promise<unknown> =>
  new Promise((resolve) => {
    if (!PerformanceObserver.supportedEntryTypes.includes("element")) return resolve(undefined);
    new PerformanceObserver(resolve).observe({ type: "element", buffered: true });
    setTimeout(resolve, PRESENTED);
  });

const frame = (): Promise<unknown> => new Promise((resolve) => requestAnimationFrame(resolve));

class Shown implements FirstPicture {
  image: HTMLImageElement | undefined;
  readonly over: Promise<void>;
  private readonly abort = new AbortController();

  constructor(
    readonly screen: Size,
    address: string,
    private readonly name: string,
  ) {
    const late = new Promise<void>((resolve) => setTimeout(resolve, PATIENCE));
    this.over = Promise.race([this.show(address).catch(() => {}), late]);
  }

  end(): void {
    this.abort.abort();
    this.image?.remove();
    this.image = undefined;
  }

  private async show(address: string): Promise<void> {
    const { signal } = this.abort;
    const response = await fetch(address, { signal });
    const place = response.headers.get("X-Picture-Place")?.split(",").map(Number);
    if (!response.ok || place?.length !== 4) return;
    const image = new Image();
    image.src = URL.createObjectURL(await response.blob());
    try {
      await image.decode();
    } finally {
      URL.revokeObjectURL(image.src);
    }
    if (signal.aborted) return;
    this.lay(image, place as [number, number, number, number]);
    await frame();
    await frame();
    await presented();
    // What begins now must not come between the second frame and the screen.
    await new Promise((resolve) => setTimeout(resolve));
  }

  private lay(image: HTMLImageElement, place: [number, number, number, number]): void {
    const [left, top, width, height] = place.map((pixels) => `${pixels / devicePixelRatio}px`);
    Object.assign(image.style, { left, top, width, height });
    image.id = "first-picture";
    image.alt = this.name;
    image.setAttribute("elementtiming", "first-picture");
    byId("map").prepend(image);
    this.image = image;
  }
}

/** What is asked for before anything else, if the server can make it. */
function begin(): FirstPicture | undefined {
  const state = asked();
  if (!state.sides.length) return undefined;
  // The page as it is with a file, so that its picture has its place.
  document.body.classList.remove("empty");
  const { width, height } = byId("map").getBoundingClientRect();
  const by = devicePixelRatio;
  const screen = { width: Math.round(width * by), height: Math.round(height * by) };
  if (!screen.width || !screen.height) return undefined;
  byId("map").classList.toggle("chequers", state.background !== "plain");
  const address = viewAddress(state, screen, document.baseURI, by);
  if (address === undefined) return undefined;
  // What lies around it is painted once the samples are drawn: without a graphics processor it takes longer than both.
  document.body.classList.add("alone");
  setTimeout(() => document.body.classList.remove("alone"), PATIENCE);
  return new Shown(screen, address, state.sides[0]?.file ?? "");
}

takeTheme();
(globalThis as { firstPicture?: FirstPicture | undefined }).firstPicture = begin();
