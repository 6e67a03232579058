// The viewer out of the program, and OpenSeadragon on the program's Deep Zoom and IIIF: `zmcraster serve` of a folder,
// looked at in a real browser.
import assert from "node:assert/strict";
import { copyFileSync, mkdirSync, mkdtempSync, readFileSync, rmSync, writeFileSync } from "node:fs";
import { tmpdir } from "node:os";
import { join } from "node:path";
import { after, before, test } from "node:test";

import type { Page } from "playwright-core";

import { headerOf, Pyramids } from "../../test/support/pyramids.js";
import type { App } from "../src/app.js";
import { assertSame, Bench, findings, idle, picture } from "./support/browser.js";
import type { Picture } from "./support/model.js";
import { Served } from "./support/served.js";

declare const viewer: App;

const bench = new Bench();
const served = new Served();
const pyramids = new Pyramids();
const folder = mkdtempSync(join(tmpdir(), "zmcraster-serve-"));
const WIDE = { viewport: { width: 1000, height: 640 } };
const NAMES = ["a #1 & <b>é.pyr", "scene.pyr", "sub/heights.pyr"];

before(async () => {
  await bench.start();
  pyramids.make([
    { name: "scene", seed: 1, array: [3, 320, 704] },
    { name: "heights", seed: 2, header: headerOf({ PIXEL_TYPE: "Int16", LEVELMAX: 1 }) },
  ]);
  mkdirSync(join(folder, "sub"));
  copyFileSync(pyramids.path("scene"), join(folder, "scene.pyr"));
  copyFileSync(pyramids.path("scene"), join(folder, "a #1 & <b>é.pyr"));
  copyFileSync(pyramids.path("heights"), join(folder, "sub/heights.pyr"));
  await served.start(folder);
});
after(async () => {
  await bench.stop();
  await served.stop();
  pyramids.remove();
  rmSync(folder, { recursive: true, force: true });
});

// Of a program that was built without the viewer only what OpenSeadragon sees is tried.
const skip = process.env["ZMC_HAS_VIEWER"] === "OFF" && "the program was built without the viewer";

/** The start page, once each card has its picture. */
async function startPage(options = {}): Promise<Page> {
  const page = await bench.visit(`${served.url}/`, { ...WIDE, ...options });
  page.on("console", (message) => {
    if (message.type() === "error") bench.complaints.push(message.text());
  });
  await filled(page, NAMES.length);
  return page;
}

async function filled(page: Page, count: number): Promise<void> {
  await page.waitForFunction(
    (count) =>
      [...document.querySelectorAll<HTMLImageElement>(".gallery img")].filter((each) => each.naturalWidth).length ===
      count,
    count,
  );
}

const heading = (page: Page, name: string) => page.getByRole("heading", { level: 1, name }).waitFor();
const card = (page: Page, name: string) => page.getByRole("listitem").filter({ hasText: name }).getByRole("link");

/** A picture that the server makes, as the browser decodes it. */
async function reference(page: Page, path: string): Promise<Picture> {
  const { width, height, text } = await page.evaluate(async (url) => {
    const bitmap = await createImageBitmap(await (await fetch(url)).blob());
    const context = new OffscreenCanvas(bitmap.width, bitmap.height).getContext(
      "2d",
    ) as OffscreenCanvasRenderingContext2D;
    context.drawImage(bitmap, 0, 0);
    const { data } = context.getImageData(0, 0, bitmap.width, bitmap.height);
    let text = "";
    for (let i = 0; i < data.length; i += 8192) text += String.fromCharCode(...data.subarray(i, i + 8192));
    return { width: bitmap.width, height: bitmap.height, text: btoa(text) };
  }, `${served.url}${path}`);
  return { width, height, pixels: Uint8Array.from(Buffer.from(text, "base64")) };
}

function partOf({ width, pixels }: Picture, left: number, top: number, columns: number, rows: number): Picture {
  const part = new Uint8Array(4 * columns * rows);
  for (let row = 0; row < rows; ++row) {
    const from = 4 * ((top + row) * width + left);
    part.set(pixels.subarray(from, from + 4 * columns), 4 * columns * row);
  }
  return { width: columns, height: rows, pixels: part };
}

test(
  "the program shows its files with pictures, and a click shows one of them, sample by sample",
  { skip },
  async () => {
    const page = await startPage();
    const asked: string[] = [];
    page.on("request", (request) => asked.push(request.url()));
    assert.deepEqual(await page.locator(".file-name").allTextContents(), NAMES);
    await page.getByText("704 × 320 · 3 bands of Byte").first().waitFor();
    await page.getByText("130 × 100 · 1 band of Int16").waitFor();
    assert.equal(await page.getByRole("status").first().textContent(), "3 files");
    await card(page, "scene.pyr").click();
    await heading(page, "scene.pyr");
    await idle(page);
    // The address follows a moment after the picture.
    await page.waitForURL((url) => url.href.startsWith(`${served.url}/#file=files/scene.pyr`));
    await page.evaluate(() => (location.hash = "file=files/scene.pyr&at=352,160&zoom=1&bands=1,2,3"));
    await page.waitForTimeout(50);
    await idle(page);
    const shown = await picture(page);
    const [left, top] = [Math.round(shown.width / 2 - 352), Math.round(shown.height / 2 - 160)];
    const [x, y] = [Math.max(-left, 0), Math.max(-top, 0)];
    const [width, height] = [Math.min(shown.width - Math.max(left, 0), 704 - x), Math.min(320 - y, shown.height)];
    const whole = await reference(page, "/preview/scene.pyr.png?size=704");
    assertSame(
      partOf(shown, Math.max(left, 0), Math.max(top, 0), width, height),
      partOf(whole, x, y, width, height),
      "beside the preview",
    );
    assert.deepEqual(
      asked.filter((url) => !url.startsWith(`${served.url}/`) && !url.startsWith("blob:")),
      [],
      "what is asked of others",
    );
    await page.context().close();
  },
);

test("names of any kind open, and back and home lead to the files again", { skip }, async () => {
  const page = await startPage();
  for (const name of NAMES) {
    await card(page, name).click();
    await heading(page, name);
    await idle(page);
    assert.equal(await page.locator("#problem").isVisible(), false, name);
    assert.equal(await page.locator("#welcome").isVisible(), false);
    await page.getByRole("link", { name: "zmcraster" }).click();
    await filled(page, NAMES.length);
    assert.equal(page.url(), `${served.url}/`);
  }
  await page.goBack();
  await heading(page, "heights.pyr");
  await page.goForward();
  await filled(page, NAMES.length);
  const [tab] = await Promise.all([
    page.context().waitForEvent("page"),
    card(page, "heights").click({ modifiers: ["Control"] }),
  ]);
  await heading(tab, "heights.pyr");
  await page.context().close();
});

test("a file is found, opened and left by keys alone", { skip }, async () => {
  const page = await startPage();
  const focused = () => page.evaluate(() => document.activeElement?.closest("a")?.textContent ?? "");
  for (let i = 0; i < 20 && !(await focused()).startsWith("scene.pyr"); ++i) await page.keyboard.press("Tab");
  assert.match(await focused(), /^scene\.pyr704 × 320/);
  await page.keyboard.press("Enter");
  await heading(page, "scene.pyr");
  await idle(page);
  assert.equal(await page.evaluate(() => document.activeElement?.id), "map");
  const zoom = () => page.locator("#zoom-level").textContent();
  const before = await zoom();
  await page.keyboard.press("+");
  await page.waitForFunction((before) => document.getElementById("zoom-level")?.textContent !== before, before);
  for (let i = 0; i < 20 && (await page.evaluate(() => document.activeElement?.id)) !== "home"; ++i)
    await page.keyboard.press("Shift+Tab");
  await page.keyboard.press("Enter");
  await filled(page, NAMES.length);
  await page.context().close();
});

for (const colorScheme of ["light", "dark"] as const)
  test(`axe finds nothing to complain of on the page of files in the ${colorScheme} theme`, { skip }, async () => {
    const page = await startPage({ colorScheme });
    assert.equal(await page.evaluate(() => document.documentElement.dataset["theme"]), colorScheme);
    assert.deepEqual(await findings(page), []);
    await page.getByText("Open another file").click();
    assert.deepEqual(await findings(page), [], "with other ways to open a file");
    const overflow = await page.evaluate(() => document.documentElement.scrollWidth - innerWidth);
    assert.ok(overflow <= 0, `${overflow}`);
    await page.context().close();
  });

test("of many files one is found by its name, and those that cannot be read say so", { skip }, async () => {
  const many = mkdtempSync(join(tmpdir(), "zmcraster-many-"));
  const server = new Served();
  const bytes = readFileSync(pyramids.path("heights"));
  for (let i = 0; i < 30; ++i) writeFileSync(join(many, `field ${i}.pyr`), bytes);
  writeFileSync(join(many, "a broken.pyr"), bytes.subarray(0, 60));
  await server.start(many);
  try {
    const page = await bench.visit(`${server.url}/`, WIDE);
    await page.getByText("31 files").waitFor();
    await card(page, "a broken").getByText("The file cannot be read").waitFor();
    await page.getByRole("searchbox", { name: "Find a file" }).fill("29 FIELD");
    await page.getByText("1 of 31 files").waitFor();
    await card(page, "field 29").locator("img").waitFor();
    await card(page, "field 29").click();
    await heading(page, "field 29.pyr");
    await page.context().close();
  } finally {
    await server.stop();
    rmSync(many, { recursive: true, force: true });
  }
});

test("the page's policy allows its own script and style and nothing else", { skip }, async () => {
  const { headers } = await fetch(`${served.url}/`);
  const policy = headers.get("Content-Security-Policy") ?? "";
  assert.match(policy, /default-src 'none'; script-src 'self'; style-src 'self';/);
  assert.doesNotMatch(policy, /unsafe/);
});

// --- OpenSeadragon

interface Seadragon {
  (options: object): {
    drawer: { canvas: HTMLCanvasElement };
    addHandler(event: string, act: (event: { item: SeadragonItem; message?: string }) => void): void;
    world: { addHandler(event: string, act: (event: { item: SeadragonItem }) => void): void };
    forceRedraw(): void;
  };
}
interface SeadragonItem {
  getFullyLoaded(): boolean;
  addHandler(event: string, act: (event: { fullyLoaded: boolean }) => void): void;
}
declare const OpenSeadragon: Seadragon;

/** What OpenSeadragon draws in so many pixels, once all tiles are there. */
async function seen(source: unknown, width: number, height: number): Promise<Picture> {
  const library = "node_modules/openseadragon/build/openseadragon/openseadragon.js";
  bench.put("openseadragon.js", Uint8Array.from(readFileSync(library)));
  const html = `<!doctype html><title>x</title><div id="v" style="width:${width}px;height:${height}px"></div>
    <script src="openseadragon.js"></script>`;
  bench.site.files.set("seadragon.html", { bytes: Buffer.from(html), type: "text/html" });
  const page = await bench.visit(`${bench.base}/seadragon.html`, WIDE);
  const text = await page.evaluate(async (tileSources) => {
    const opened = OpenSeadragon({
      id: "v",
      tileSources,
      // The other drawers make tiles without an overlap larger by a pixel.
      drawer: "webgl",
      // No level that is finer than the screen.
      minPixelRatio: 1,
      crossOriginPolicy: "Anonymous",
      imageSmoothingEnabled: false,
      immediateRender: true,
      blendTime: 0,
      animationTime: 0,
      showNavigationControl: false,
    });
    await new Promise<void>((resolve, reject) => {
      opened.addHandler("open-failed", ({ message }) => reject(new Error(message)));
      opened.addHandler("tile-load-failed", ({ message }) => reject(new Error(message)));
      opened.world.addHandler("add-item", ({ item }) => {
        if (item.getFullyLoaded()) resolve();
        item.addHandler("fully-loaded-change", ({ fullyLoaded }) => fullyLoaded && resolve());
      });
    });
    opened.forceRedraw();
    await new Promise((resolve) => requestAnimationFrame(() => requestAnimationFrame(resolve)));
    const { canvas } = opened.drawer;
    const { data } = (canvas.getContext("2d") as CanvasRenderingContext2D).getImageData(
      0,
      0,
      canvas.width,
      canvas.height,
    );
    let text = "";
    for (let i = 0; i < data.length; i += 8192) text += String.fromCharCode(...data.subarray(i, i + 8192));
    return btoa(text);
  }, source);
  await page.context().close();
  return { width, height, pixels: Uint8Array.from(Buffer.from(text, "base64")) };
}

async function information(path: string): Promise<object> {
  const info = (await (await fetch(`${served.url}${path}`)).json()) as object;
  return { ...info, preferredFormats: ["png"] };
}

const SIZES = [
  [704, 320],
  [352, 160],
] as const;
const STYLES = ["", "bands=2&stretch=10,200&colormap=viridis"];

test("OpenSeadragon draws the Deep Zoom image as the preview has it, at two levels and in a style", async () => {
  const page = await bench.visit(`${served.url}/healthz`, WIDE);
  for (const [width, height] of SIZES)
    for (const style of STYLES) {
      const drawn = await seen(`${served.url}/dzi/scene.pyr.dzi?format=png&${style}`, width, height);
      const expected = await reference(page, `/preview/scene.pyr.png?size=${width}&${style}`);
      assertSame(drawn, expected, `${width} ${style}`);
    }
  await page.context().close();
});

test("OpenSeadragon draws the IIIF image as the preview has it, at two levels and in a style", async () => {
  const page = await bench.visit(`${served.url}/healthz`, WIDE);
  for (const [width, height] of SIZES)
    for (const style of STYLES) {
      const drawn = await seen(await information(`/iiif/scene.pyr/info.json?${style}`), width, height);
      const expected = await reference(page, `/preview/scene.pyr.png?size=${width}&${style}`);
      assertSame(drawn, expected, `${width} ${style}`);
    }
  await page.context().close();
});

test("OpenSeadragon opens both by their addresses, whatever the name, and gets JPEG", async () => {
  const page = await bench.visit(`${served.url}/healthz`, WIDE);
  const name = NAMES[0] as string;
  const expected = await reference(page, "/preview/scene.pyr.jpg?size=352");
  const encoded = encodeURIComponent(name);
  for (const source of [`${served.url}/dzi/${encoded}.dzi`, `${served.url}/iiif/${encoded}/info.json`]) {
    const { pixels } = await seen(source, 352, 160);
    const sum = pixels.reduce((sum, value, i) => sum + Math.abs(value - (expected.pixels[i] as number)), 0);
    assert.ok(sum / pixels.length < 1, `${source}: ${sum / pixels.length}`);
  }
  await page.context().close();
});

test("no page of the program complained", () => assert.deepEqual(bench.complaints, []));
