// The first picture: what `zmcraster serve` makes of the view of a link, on the page until the samples are drawn.
import assert from "node:assert/strict";
import { mkdtempSync, rmSync, writeFileSync } from "node:fs";
import { tmpdir } from "node:os";
import { join } from "node:path";
import { after, before, test } from "node:test";

import type { Page } from "playwright-core";

import { documentOf, fileOf, headerOf } from "../../test/support/pyramids.js";
import type { App } from "../src/app.js";
import { Bench, findings, idle, picture } from "./support/browser.js";
import type { Picture } from "./support/model.js";
import { Served } from "./support/served.js";

declare const viewer: App;

const bench = new Bench();
const served = new Served();
const folder = mkdtempSync(join(tmpdir(), "zmcraster-first-"));
const skip = process.env["ZMC_HAS_VIEWER"] === "OFF" && "the program was built without the viewer";
const WIDE = { viewport: { width: 1000, height: 640 } };
const [WIDTH, HEIGHT] = [601, 403];

/** A raster of one level without sudden changes, which a picture of any size and format is near to. */
function smooth(
  type: "Byte" | "Int16",
  bands: number,
  value: (x: number, y: number, band: number) => number,
): Uint8Array {
  const header = headerOf({ PIXEL_TYPE: type, PIXEL_WIDTH: WIDTH, PIXEL_HEIGHT: HEIGHT, BANDS: bands, TILESIZE: 1024 });
  const samples = new (type === "Byte" ? Uint8Array : Int16Array)(WIDTH * HEIGHT * bands);
  for (let i = 0; i < samples.length; ++i) {
    const pixel = Math.floor(i / bands);
    samples[i] = value(pixel % WIDTH, Math.floor(pixel / WIDTH), i % bands);
  }
  return fileOf(documentOf(header), Buffer.from(samples.buffer));
}

before(async () => {
  await bench.start();
  const put = (name: string, bytes: Uint8Array | string): void => writeFileSync(join(folder, name), bytes);
  put(
    "a #1 & é.pyr",
    smooth("Byte", 3, (x, y, band) => [x / 3, y / 2, (x + y) / 6][band] as number),
  );
  put(
    "holes.pyr",
    smooth("Int16", 1, (x, y) => (x > 200 && x < 400 && y > 100 && y < 300 ? -999 : x - y)),
  );
  put(
    "holes.pyr.aux.xml",
    "<PAMDataset><PAMRasterBand band='1'><NoDataValue>-999</NoDataValue></PAMRasterBand></PAMDataset>",
  );
  await served.start(folder);
});
after(async () => {
  await bench.stop();
  await served.stop();
  rmSync(folder, { recursive: true, force: true });
});

interface Held {
  page: Page;
  asked: string[];
  release: () => void;
}

/** A page whose samples do not come before they are let go. */
async function held(address: string, options: object = {}, files = "**/files/**"): Promise<Held> {
  const page = await bench.visit(`${served.url}/healthz`, { ...WIDE, ...options });
  const asked: string[] = [];
  page.on("request", (request) => asked.push(request.url().slice(served.url.length)));
  let release = (): void => {};
  const released = new Promise<void>((resolve) => (release = resolve));
  await page.route(files, async (route) => {
    await released;
    await route.continue();
  });
  await page.goto(`${served.url}/${address}`);
  return { page, asked, release };
}

const heading = (page: Page, name: string) => page.getByRole("heading", { level: 1, name }).waitFor();
const early = (page: Page) => page.locator("#first-picture").waitFor();

/** The first picture on the screen, and the rectangle that it is laid on, in pixels of the screen. */
async function firstPicture(page: Page): Promise<{ shown: Picture; place: number[]; type: string }> {
  await early(page);
  const { text, ...rest } = await page.evaluate(() => {
    const image = document.getElementById("first-picture") as HTMLImageElement;
    const map = (document.getElementById("map") as HTMLElement).getBoundingClientRect();
    const [by, at] = [devicePixelRatio, image.getBoundingClientRect()];
    const place = [at.left - map.left, at.top - map.top, at.width, at.height].map((each) => each * by);
    const [width, height] = [Math.round(map.width * by), Math.round(map.height * by)];
    const context = new OffscreenCanvas(width, height).getContext("2d") as OffscreenCanvasRenderingContext2D;
    context.imageSmoothingEnabled = false;
    context.drawImage(image, ...(place as [number, number, number, number]));
    const { data } = context.getImageData(0, 0, width, height);
    let text = "";
    for (let i = 0; i < data.length; ++i)
      text += String.fromCharCode(
        i % 4 === 3 ? (data[i] as number) : Math.round(((data[i] as number) * (data[i | 3] as number)) / 255),
      );
    return { width, height, place, text: btoa(text), type: getComputedStyle(image).position };
  });
  const shown = { width: rest.width, height: rest.height, pixels: Uint8Array.from(Buffer.from(text, "base64")) };
  return { shown, place: rest.place, type: rest.type };
}

/** The rectangle of what is not transparent: left, top, width, height. */
function extent({ width, height, pixels }: Picture): number[] {
  let [left, top, right, bottom] = [width, height, 0, 0];
  for (let y = 0; y < height; ++y)
    for (let x = 0; x < width; ++x)
      if (pixels[4 * (y * width + x) + 3]) {
        [left, top] = [Math.min(left, x), Math.min(top, y)];
        [right, bottom] = [Math.max(right, x + 1), Math.max(bottom, y + 1)];
      }
  return [left, top, right - left, bottom - top];
}

const apart = (a: Picture, b: Picture): number =>
  a.pixels.reduce((sum, value, i) => sum + Math.abs(value - (b.pixels[i] as number)), 0) / a.pixels.length;

const SCENE = `file=${encodeURIComponent("files/a%20%231%20%26%20%C3%A9.pyr")}`;
const VIEWS: [link: string, dense: number][] = [
  [`?${SCENE}`, 1],
  [`#${SCENE}`, 1],
  [`#${SCENE}`, 2],
  [`#${SCENE}`, 1.25],
  [`#${SCENE}&at=100.25,50.75&zoom=0.6`, 1],
  [`#${SCENE}&at=570,390&zoom=0.9&bands=3,2,1&stretch=0,200;10,180;20,160&gamma=1.7`, 1],
  [`#${SCENE}&at=300,200&zoom=1&bands=2&stretch=0,201&colormap=-viridis`, 1],
  [`#${SCENE}&at=321.5,123&zoom=7.3`, 1],
  ["#file=files/holes.pyr", 1],
  ["#file=files/holes.pyr&at=210,110&zoom=0.4&bands=1&stretch=-300,500&nodata=none", 1],
];

for (const [address, deviceScaleFactor] of VIEWS)
  test(
    `the server's picture is where the samples are drawn, and looks as they do: ${address}, ${deviceScaleFactor}`,
    {
      skip,
    },
    async () => {
      const { page, release } = await held(address, { deviceScaleFactor });
      const { shown, place } = await firstPicture(page);
      assert.equal(await page.locator("#picture").isVisible(), false);
      release();
      await idle(page);
      const drawn = await picture(page);
      const [left, top, width, height] = place.map(Math.round) as [number, number, number, number];
      const inside = (from: number, size: number, all: number): number[] => [
        Math.max(from, 0),
        Math.min(from + size, all) - Math.max(from, 0),
      ];
      const [x, y] = [inside(left, width, drawn.width), inside(top, height, drawn.height)];
      assert.deepEqual([x[0], y[0], x[1], y[1]], extent(drawn), "the place");
      assert.ok(apart(shown, drawn) < 2.5, `${apart(shown, drawn)} steps apart`);
      await page.waitForFunction(() => !document.getElementById("first-picture"));
      assert.equal(await page.locator("#picture").isVisible(), true);
      await page.context().close();
    },
  );

test("no frame is without a picture while the samples take the place of the first", { skip }, async () => {
  const { page, release } = await held(`#${SCENE}`);
  await early(page);
  await page.evaluate(() => {
    const image = document.getElementById("first-picture") as HTMLImageElement;
    const canvas = document.getElementById("picture") as HTMLCanvasElement;
    const frames: string[] = ((globalThis as unknown as { frames: string[] }).frames = []);
    const look = (): void => {
      frames.push(`${image.isConnected} ${getComputedStyle(canvas).visibility}`);
      requestAnimationFrame(look);
    };
    look();
  });
  release();
  await idle(page);
  await page.waitForFunction(() => (globalThis as unknown as { frames: string[] }).frames.at(-1)?.startsWith("false"));
  const frames = await page.evaluate(() => (globalThis as unknown as { frames: string[] }).frames);
  const kinds = frames.filter((each, i) => each !== frames[i - 1]);
  assert.deepEqual(kinds, ["true hidden", "true visible", "false visible"]);
  assert.ok(frames.filter((each) => each === "true visible").length >= 2);
  await page.context().close();
});

test("whoever moves the view sees the samples at once", { skip }, async () => {
  for (const act of ["wheel", "key"] as const) {
    const { page, release } = await held(`#${SCENE}`);
    await early(page);
    await page.waitForFunction(() => "viewer" in globalThis);
    assert.equal(await page.locator("#picture").isVisible(), false, act);
    if (act === "wheel") {
      await page.mouse.move(300, 300);
      await page.mouse.wheel(0, -200);
    } else await page.keyboard.press("Tab");
    await page.waitForFunction(() => !document.getElementById("first-picture"));
    assert.equal(await page.locator("#picture").isVisible(), true, act);
    release();
    await idle(page);
    assert.ok(extent(await picture(page))[2], act);
    await page.context().close();
  }
});

test("the samples are shown as ever where the server makes no picture, or a wrong one", { skip }, async () => {
  for (const status of [404, 500, 503, 200]) {
    const page = await bench.visit(`${served.url}/healthz`, WIDE);
    await page.route("**/view/**", (route) =>
      route.fulfill({ status, body: "nothing", headers: { "X-Picture-Place": "0,0,9,9" } }),
    );
    await page.goto(`${served.url}/#${SCENE}`);
    await idle(page);
    assert.ok(extent(await picture(page))[2], `${status}`);
    assert.equal(await page.locator("#picture").isVisible(), true);
    assert.equal(await page.locator("#first-picture").count(), 0);
    await page.context().close();
  }
});

test(
  "a picture is asked for once, of one side, of the page's own server and of what it has words for",
  { skip },
  async () => {
    const asked = async (address: string): Promise<string[]> => {
      const { page, asked, release } = await held(address, {}, "**/none/**");
      release();
      await idle(page);
      await page.context().close();
      return asked.filter((path) => path.startsWith("/view/"));
    };
    assert.equal((await asked(`#${SCENE}`)).length, 1);
    assert.deepEqual(await asked(""), []);
    assert.deepEqual(await asked(`#${SCENE}&b.file=files/holes.pyr`), []);
    assert.deepEqual(await asked(`#file=${bench.base}/files/elsewhere.pyr`), []);
    assert.deepEqual(await asked(`#${SCENE}&bands=1,2,3&stretch=0,9`), []);
  },
);

test("a page of another server has no script for it", async () => {
  const page = await bench.open("");
  assert.equal(await page.locator("script").count(), 1);
  await page.context().close();
});

for (const colorScheme of ["light", "dark"] as const)
  test(`axe finds nothing to complain of in the first picture in the ${colorScheme} theme`, { skip }, async () => {
    const { page, release } = await held(`#${SCENE}`, { colorScheme });
    await early(page);
    // The samples do not come: what lies around the picture does not wait for them for ever.
    await page.waitForFunction(() => !document.body.classList.contains("alone"));
    await heading(page, "a #1 & é.pyr");
    assert.equal(await page.evaluate(() => document.documentElement.dataset["theme"]), colorScheme);
    assert.deepEqual(await findings(page), []);
    release();
    await page.context().close();
  });

test("no page complained", () => assert.deepEqual(bench.complaints, []));
