// The start page of a server that tells its files: a picture of each, to choose from.
import { Pyramid } from "../../src/pyramid.js";
import { h, icon } from "./dom.js";
import { messageOf } from "./messages.js";
import { type Origin, originOf } from "./raster.js";

/** A file of the server's list. */
export interface Listed {
  name: string;
  url: string;
  /** A small picture of it, where the server makes some. */
  preview?: string;
}

export interface Listing {
  files: Listed[];
  /** Whether there are no more than these. */
  complete: boolean;
}

const AT_ONCE = 4; // cards that are filled in together, so that a server of many files has nobody wait
const TRIES = 3;
const FEW = 8; // files that need no search
const MARK = "M9 3h6v4H9zM6 9h5v5H6zM13 9h5v5h-5zM2 16h6v5H2zM9 16h6v5H9zM16 16h6v5h-6z";

/** The files that the server offers; nothing where it has no list, or an empty one. */
export async function offered(): Promise<Listing | undefined> {
  if (!location.protocol.startsWith("http")) return undefined;
  try {
    const response = await fetch("api", { headers: { Accept: "application/json" } });
    if (!response.ok || !response.headers.get("Content-Type")?.includes("json")) return undefined;
    const { files, complete } = (await response.json()) as { files?: unknown; complete?: unknown };
    const isListed = (each: unknown): each is Listed =>
      typeof (each as Listed)?.name === "string" && URL.canParse(String((each as Listed)?.url), document.baseURI);
    const listed = Array.isArray(files) ? files.filter(isListed) : [];
    return listed.length ? { files: listed, complete: complete !== false } : undefined;
  } catch {
    return undefined;
  }
}

/** Where a listed file is. Of the page's own server it is told from the page on, so that links are short. */
export function originOfListed({ name, url }: Listed): Origin {
  const [page, file] = [new URL(".", document.baseURI), new URL(url, document.baseURI)];
  const own = file.origin === page.origin && file.pathname.startsWith(page.pathname);
  return { ...originOf(own ? file.href.slice(page.href.length) : url), name };
}

/** Fills in cards as they come into view, some at once, until it is told to end. */
class Filling {
  private readonly abort = new AbortController();
  private readonly waiting: Card[] = [];
  private busy = 0;
  private readonly watch = new IntersectionObserver(
    (entries) => {
      for (const { isIntersecting, target } of entries) if (isIntersecting) this.add(target);
    },
    { rootMargin: "300px" },
  );

  constructor(private readonly cards: ReadonlyMap<Element, Card>) {
    for (const element of cards.keys()) this.watch.observe(element);
  }

  end(): void {
    this.abort.abort();
    this.watch.disconnect();
  }

  private add(element: Element): void {
    this.watch.unobserve(element);
    this.waiting.push(this.cards.get(element) as Card);
    while (this.busy < AT_ONCE && this.waiting.length) void this.fill(this.waiting.shift() as Card);
  }

  private async fill(card: Card): Promise<void> {
    ++this.busy;
    await card.fill(this.abort.signal);
    --this.busy;
    const next = this.waiting.shift();
    if (next && !this.abort.signal.aborted) void this.fill(next);
  }
}

class Card {
  readonly element: HTMLElement;
  private readonly picture = h("span", { class: "thumb" }, icon(MARK));
  private readonly facts = h("span", { class: "note" });

  constructor(
    readonly file: Listed,
    open: (origin: Origin) => void,
  ) {
    const { name } = file;
    const end = name.lastIndexOf("/") + 1;
    const origin = originOfListed(file);
    const click = (event: MouseEvent): void => {
      // With these keys browsers open a tab or a window of their own.
      if (event.ctrlKey || event.metaKey || event.shiftKey || event.altKey) return;
      event.preventDefault();
      open(origin);
    };
    const title = h(
      "span",
      { class: "file-name" },
      end > 0 && h("span", { class: "folder" }, name.slice(0, end)),
      name.slice(end),
    );
    const href = `#${new URLSearchParams({ file: origin.url ?? "" })}`;
    this.element = h("li", {}, h("a", { href, onclick: click }, this.picture, title, this.facts));
  }

  /** Does not reject: what fails is told on the card. */
  async fill(signal: AbortSignal): Promise<void> {
    try {
      await this.tell(signal);
      await this.show(signal);
    } catch (error) {
      if (!signal.aborted) this.facts.textContent = messageOf(error).title;
    }
  }

  private async tell(signal: AbortSignal): Promise<void> {
    const pyramid = await Pyramid.open(new URL(this.file.url, document.baseURI), { signal });
    const { width, height, bands, pixelType } = pyramid.header;
    this.facts.textContent = `${width} × ${height} · ${bands} ${bands === 1 ? "band" : "bands"} of ${pixelType}`;
    await pyramid.close();
  }

  private async show(signal: AbortSignal): Promise<void> {
    const blob = this.file.preview && (await pictureAt(this.file.preview, signal));
    if (!blob) return;
    const src = URL.createObjectURL(blob);
    const done = (): void => URL.revokeObjectURL(src);
    // The name of the file says what it shows.
    this.picture.replaceChildren(h("img", { src, alt: "", onload: done, onerror: done }));
  }
}

/** A picture, for which a server that is busy is asked again. */
async function pictureAt(url: string, signal: AbortSignal): Promise<Blob | undefined> {
  for (let attempt = 1; ; ++attempt) {
    const response = await fetch(new URL(url, document.baseURI), { signal });
    if (response.ok) return await response.blob();
    await response.body?.cancel();
    if (response.status !== 503 || attempt === TRIES) return undefined;
    const seconds = Number(response.headers.get("Retry-After")) || 1;
    await new Promise((resolve) => setTimeout(resolve, Math.min(seconds, 5) * 1000));
  }
}

/** The page of all files. `end` lets go of it. */
export function gallery(
  { files, complete }: Listing,
  open: (origin: Origin) => void,
): { element: HTMLElement; end: () => void } {
  const cards = files.map((file) => new Card(file, open));
  const filling = new Filling(new Map(cards.map((card) => [card.element, card])));
  const told = (shown: number): string => {
    const all = `${files.length}${complete ? "" : " and more"} ${files.length === 1 ? "file" : "files"}`;
    return shown === files.length ? all : `${shown} of ${all}`;
  };
  const count = h("p", { class: "note", role: "status" }, told(files.length));
  const search = h("input", {
    type: "search",
    placeholder: "Find a file",
    "aria-label": "Find a file",
    spellcheck: "false",
    oninput: () => {
      const words = search.value.toLowerCase().split(/\s+/);
      for (const { element, file } of cards)
        element.hidden = !words.every((word) => file.name.toLowerCase().includes(word));
      count.textContent = told(cards.filter(({ element }) => !element.hidden).length);
    },
  });
  const list = h("ul", { class: "gallery", "aria-label": "Files of this server" });
  list.append(...cards.map(({ element }) => element));
  const head = h("div", { class: "gallery-head" }, h("h2", {}, "Pyramids"), count, files.length > FEW && search);
  return { element: h("div", { class: "start" }, head, list), end: () => filling.end() };
}
