// Every control of the viewer, by pointer and by keyboard, in a real browser.
import assert from "node:assert/strict";
import { readFileSync } from "node:fs";
import { after, before, test } from "node:test";

import type { Page } from "playwright-core";

import { headerOf, Pyramids } from "../../test/support/pyramids.js";
import type { App } from "../src/app.js";
import { type Pace, REST } from "../src/pace.js";
import type { Renderer } from "../src/renderer.js";
import { assertSame, Bench, findings, go, idle, link, picture } from "./support/browser.js";

declare const viewer: App;

const bench = new Bench();
const pyramids = new Pyramids();
const WIDE = { viewport: { width: 900, height: 500 } };
let page: Page;

before(async () => {
  await bench.start();
  const size = { PIXEL_WIDTH: 300, PIXEL_HEIGHT: 200, TILESIZE: 64, LEVELMAX: 2 };
  pyramids.make([
    { name: "three", seed: 1, array: [3, 400, 600], options: ["EMBED=YES"] },
    { name: "one", seed: 2, header: headerOf({ ...size, PIXEL_TYPE: "Int16" }) },
    { name: "woven", seed: 3, header: headerOf({ ...size, BANDS: 3, PIXEL_TYPE: "UInt16", BUILD_METHOD: "Morton" }) },
    { name: "complex", seed: 4, header: headerOf({ ...size, PIXEL_TYPE: "ComplexSingle" }) },
    { name: "wide", seed: 5, header: headerOf({ ...size, BANDS: 2, PIXEL_TYPE: "UInt64" }) },
  ]);
  for (const name of ["three", "one", "woven", "complex", "wide"]) bench.put(`${name}.pyr`, pyramids.bytes(name));
  page = await bench.open("", WIDE);
  await page.context().grantPermissions(["clipboard-read", "clipboard-write"]);
});
after(async () => {
  await bench.stop();
  pyramids.remove();
});

const field = (name: string) => page.getByRole("combobox", { name, exact: true });
const pressed = (name: string) => page.getByRole("button", { name, exact: true }).getAttribute("aria-pressed");
const click = (name: string) => page.getByRole("button", { name, exact: true }).click();
const announced = () => page.locator("#live").textContent();

/** What an action changes in the link, and that it costs no request for the file. */
async function changes(
  name: string,
  act: () => Promise<unknown>,
  expected: Record<string, string | null>,
): Promise<void> {
  await idle(page);
  bench.site.requests(name);
  const before = await picture(page);
  await act();
  const after = await link(page);
  await idle(page);
  for (const [key, value] of Object.entries(expected)) assert.equal(after.get(key), value, key);
  assert.equal(bench.site.requests(name), 0, "requests");
  const same = Buffer.compare(before.pixels, (await picture(page)).pixels) === 0;
  assert.equal(same, false, "the picture changes");
}

test("a file opens as its records and bands suggest, whole and in the middle", async () => {
  await go(page, "file=three.pyr");
  const told = await link(page);
  assert.equal(told.get("bands"), "1,2,3");
  assert.equal(told.get("stretch"), "0,255;0,255;0,255");
  assert.equal(told.get("at"), "300,200");
  assert.equal(await page.title(), "three.pyr – zmcraster");
  await go(page, "file=one.pyr");
  assert.equal((await link(page)).get("bands"), "1");
  await page.getByText("From the coarsest level.").waitFor();
});

test("bands, stretch, gamma, colours and no data change the picture without a request, and stand in the link", async () => {
  await go(page, "file=three.pyr");
  const same = (act: () => Promise<unknown>, expected: Record<string, string | null>) =>
    changes("three.pyr", act, expected);
  await same(() => field("Red").selectOption("2"), { bands: "3,2,3" });
  await same(() => field("Green").selectOption("0"), { bands: "3,1,3" });
  await same(() => field("Blue").selectOption("1"), { bands: "3,1,2" });
  await same(() => field("Opacity").selectOption("0"), { alpha: "1" });
  await same(() => field("Opacity").selectOption(""), { alpha: null });
  await same(() => field("Range").selectOption("percent"), { stretch: percentiles([2, 0, 1]) });
  await same(() => field("Range").selectOption("ends"), { stretch: "0,249;0,249;0,249" });
  await same(() => field("Range").selectOption("deviations"), { stretch: (await usualDeviations()) as string });
  await same(() => field("Range").selectOption("type"), { stretch: "0,255;0,255;0,255" });
  await same(() => page.getByRole("slider", { name: "Gamma" }).fill("0.5"), { gamma: "2" });
  await same(() => click("One band"), { bands: "3", gamma: "2" });
  await same(() => field("Band").selectOption("1"), { bands: "2" });
  await same(() => field("Colours").selectOption("viridis"), { colormap: "viridis" });
  await same(() => page.getByRole("checkbox", { name: "Reversed" }).check(), { colormap: "-viridis" });
  await same(() => page.getByRole("checkbox", { name: "Reversed" }).uncheck(), { colormap: "viridis" });
  await field("No data").selectOption("own");
  await same(
    () =>
      page
        .getByRole("textbox", { name: "Value" })
        .fill("77")
        .then(() => page.keyboard.press("Enter")),
    { nodata: "77" },
  );
  await same(() => field("No data").selectOption("none"), { nodata: "none" });
  await same(() => click("Three bands"), { bands: "1,2,3" });
});

// The values with so many samples up to them, counted out.
function percentiles(bands: number[]): string {
  const all = pyramids.expected("three", 0);
  const pairs = bands.map((band) => {
    const sorted = all
      .subarray(240000 * band, 240000 * (band + 1))
      .slice()
      .sort();
    return [0.02, 0.98].map((share) => sorted[Math.ceil(share * 240000) - 1]);
  });
  return pairs.map((pair) => pair.join(",")).join(";");
}

// Mean and deviation as the file archives them, which the page shows with all their digits.
async function usualDeviations(): Promise<string> {
  const { Pyramid } = await import("zmcraster-web");
  const { statistics } = await (await Pyramid.open(pyramids.bytes("three"))).metadata();
  const ends = [2, 0, 1].map((band) => {
    const { mean = 0, standardDeviation = 0 } = statistics(band) ?? {};
    return [mean - 2 * standardDeviation, mean + 2 * standardDeviation].map((value) => Number(value.toPrecision(15)));
  });
  return ends.map((pair) => pair.join(",")).join(";");
}

test("the handles of the histogram move by keys, by the pointer and by numbers", async () => {
  await go(page, "file=three.pyr&bands=2&stretch=20,200");
  const [minimum, maximum] = ["Minimum of Band 2", "Maximum of Band 2"].map((name) =>
    page.getByRole("slider", { name, exact: true }),
  );
  const value = async (slider = minimum) => Number(await slider?.getAttribute("aria-valuenow"));
  await minimum?.focus();
  for (const [key, expected] of [
    ["ArrowRight", 21],
    ["ArrowUp", 22],
    ["ArrowLeft", 21],
    ["ArrowDown", 20],
    ["PageUp", 30],
    ["PageDown", 20],
    ["End", 200],
    ["Home", 0],
  ] as const) {
    await page.keyboard.press(key);
    assert.equal(await value(), expected, key);
  }
  assert.equal((await link(page)).get("stretch"), "0,200");
  const box = (await maximum?.boundingBox()) as { x: number; y: number; width: number };
  await page.mouse.move(box.x + box.width / 2, box.y + 20);
  await page.mouse.down();
  await page.mouse.move(box.x + box.width / 2 - 60, box.y + 20, { steps: 3 });
  await page.mouse.up();
  const moved = await value(maximum);
  assert.ok(moved > 100 && moved < 180, `${moved}`);
  assert.equal((await link(page)).get("stretch"), `0,${moved}`);
  const number = page.getByRole("spinbutton", { name: "Maximum of Band 2, as a number" });
  await number.fill("123.5");
  await number.press("Enter");
  assert.equal((await link(page)).get("stretch"), "0,123.5");
  assert.equal(await field("Range").inputValue(), "");
});

test("a change of style is drawn within 16 ms, on a processor without graphics too", async () => {
  await go(page, "file=three.pyr&bands=1,2,3&at=300,200&zoom=1");
  const times = await page.evaluate(() => Array.from({ length: 40 }, () => viewer.time()));
  const best = Math.min(...times);
  assert.ok(best < 16, `${best} ms at best of ${times.map((time) => time.toFixed(1)).join(" ")}`);
});

/**
 * The grains of the pictures that are drawn while a handle is moved once in each of eight frames, and rests then, where a
 * picture takes so long. When it rests the test tells: on a busy machine it may between any two frames.
 */
async function grainsOf(milliseconds: number): Promise<number[]> {
  await page.evaluate((milliseconds) => {
    const { renderer, pace } = viewer as unknown as { renderer: Renderer; pace: Pace };
    const grains: number[] = ((globalThis as unknown as { grains: number[] }).grains = []);
    const draw = renderer.draw.bind(renderer);
    renderer.draw = (layers, placement, ask, grain) => {
      grains.push(grain ?? 1);
      draw(layers, placement, ask, grain);
    };
    Object.defineProperty(pace, "took", { get: () => milliseconds, set() {}, configurable: true });
  }, milliseconds);
  await page.getByRole("slider", { name: "Minimum of Band 2", exact: true }).evaluate(async (slider, rest) => {
    const { setTimeout } = window;
    let atRest = () => {};
    window.setTimeout = ((call: () => void, delay?: number) => {
      if (delay !== rest) return setTimeout(call, delay);
      atRest = call;
      return -1;
    }) as typeof window.setTimeout;
    for (let frame = 0; frame < 8; ++frame) {
      slider.dispatchEvent(new KeyboardEvent("keydown", { key: "ArrowRight", bubbles: true }));
      await new Promise((resolve) => requestAnimationFrame(resolve));
    }
    window.setTimeout = setTimeout;
    atRest();
  }, REST);
  await idle(page);
  return page.evaluate(() => {
    const { renderer } = viewer as unknown as { renderer: Partial<Renderer> };
    delete renderer.draw; // that of its class is left
    return (globalThis as unknown as { grains: number[] }).grains;
  });
}

test("changes of style are drawn in fewer pixels where all take too long, and in all once there are no more", async () => {
  await go(page, "file=three.pyr&bands=2&stretch=20,200");
  // What a picture takes is known before the first change.
  await page.waitForFunction(() => (viewer as unknown as { pace: Pace }).pace.took > 0);
  const slow = await grainsOf(40);
  // Once the programs of other styles are made, all is drawn once more, whenever that is.
  assert.ok(slow.filter((grain) => grain === 2).length >= 7 && slow.length <= 10, `${slow}`);
  assert.equal(slow.at(-1), 1);
  assert.deepEqual([...new Set(await grainsOf(4))], [1]);
});

test("complex samples are shown in all their parts", async () => {
  await go(page, "file=complex.pyr");
  for (const part of ["real", "imaginary", "phase"]) {
    await field("Shown").selectOption(part);
    assert.equal((await link(page)).get("complex"), part);
  }
  assert.match((await link(page)).get("stretch") as string, /^-3.14159265358979,3.14159265358979$/);
});

test("every band under the pointer is told exactly, with its place", async () => {
  const { Pyramid } = await import("zmcraster-web");
  const pyramid = await Pyramid.open(pyramids.bytes("wide"));
  await go(page, "file=wide.pyr&at=150,100&zoom=1");
  const map = (await page.locator("#map").boundingBox()) as { x: number; y: number; width: number; height: number };
  await page.mouse.move(map.x + Math.round(map.width / 2) + 10, map.y + Math.round(map.height / 2) - 5);
  const { data } = await pyramid.readWindow(0, { x: 160, y: 95, width: 1, height: 1 });
  await page.getByText("column 160, row 95").waitFor();
  await page.waitForFunction(() => document.querySelector("#values dd")?.textContent?.length !== 1);
  assert.deepEqual(await page.locator("#values dd").allTextContents(), [...data].map(String));
  assert.ok([...data].some((value) => Number(value) > Number.MAX_SAFE_INTEGER));
});

test("coordinates come in the raster's own system and in degrees, and the scale in metres", async () => {
  const wkt =
    'PROJCS["WGS 84 / UTM zone 33N",GEOGCS["WGS 84",DATUM["WGS_1984",SPHEROID["WGS 84",6378137,298.257223563]],PRIMEM["Greenwich",0],UNIT["degree",0.0174532925199433]],PROJECTION["Transverse_Mercator"],PARAMETER["latitude_of_origin",0],PARAMETER["central_meridian",15],PARAMETER["scale_factor",0.9996],PARAMETER["false_easting",500000],PARAMETER["false_northing",0],UNIT["metre",1]]';
  const sidecar = `<PAMDataset><SRS>${wkt}</SRS><GeoTransform>500000, 30, 0, 4000000, 0, -30</GeoTransform></PAMDataset>`;
  bench.put("one.pyr.aux.xml", new TextEncoder().encode(sidecar));
  await go(page, "file=three.pyr");
  await go(page, "file=one.pyr&at=150,100&zoom=1");
  await page.locator("#scale-label", { hasText: " km" }).waitFor();
  const map = (await page.locator("#map").boundingBox()) as { x: number; y: number; width: number; height: number };
  await page.mouse.move(map.x + Math.round(map.width / 2), map.y + Math.round(map.height / 2));
  const place = await page.locator("#place").textContent();
  // By PROJ 504500, 3997000 is 15.0500036 E, 36.1176604 N.
  assert.match(place as string, /^column 150, row 100504500, 399700036\.11766° N, 15\.05000° E$/);
  assert.equal(await page.locator("#scale-label").textContent(), "2 km");
  bench.site.files.delete("one.pyr.aux.xml");
});

test("the picture moves by drag, wheel, double click, pinch, buttons and keys", async () => {
  const start = "file=three.pyr&at=300,200&zoom=1";
  const view = async () => {
    await idle(page);
    const told = await link(page);
    return [...(told.get("at") as string).split(",").map(Number), Number(told.get("zoom"))];
  };
  const map = page.locator("#map");
  const box = (await map.boundingBox()) as { x: number; y: number; width: number; height: number };
  const [x, y] = [Math.round(box.x + box.width / 2), Math.round(box.y + box.height / 2)];
  const from = async (act: () => Promise<unknown>): Promise<number[]> => {
    await go(page, start);
    await act();
    return view();
  };
  const drag = async () => {
    await page.mouse.move(x, y);
    await page.mouse.down();
    await page.mouse.move(x - 50, y + 30, { steps: 4 });
    await page.mouse.up();
  };
  assert.deepEqual(await from(drag), [350, 170, 1]);
  const wheeled = await from(() => page.mouse.move(x, y).then(() => page.mouse.wheel(0, -240)));
  assert.ok((wheeled[2] as number) > 1.3 && Math.abs((wheeled[0] as number) - 300) < 1, `${wheeled}`);
  assert.deepEqual((await from(() => page.mouse.dblclick(x, y)))[2], 2);
  assert.deepEqual(await from(() => click("Nearer")), [300, 200, 2]);
  assert.deepEqual(await from(() => click("Farther")), [300, 200, 0.5]);
  await click("1:1, one sample for each pixel");
  assert.deepEqual(await view(), [300, 200, 1]);
  const fit = (await from(() => click("Whole raster")))[2] as number;
  assert.ok(Math.abs(fit - Math.min(box.width / 600, box.height / 400) * 0.94) < 0.001, `${fit}`);
  const key = (...keys: string[]) =>
    from(async () => {
      await map.focus();
      for (const each of keys) await page.keyboard.press(each);
    });
  assert.deepEqual(await key("ArrowRight", "ArrowDown"), [380, 280, 1]);
  assert.deepEqual(await key("ArrowLeft", "ArrowUp"), [220, 120, 1]);
  assert.deepEqual(await key("Shift+ArrowRight", "Shift+ArrowDown"), [301, 201, 1]);
  assert.deepEqual(await key("+"), [300, 200, 2]);
  assert.deepEqual(await key("-"), [300, 200, 0.5]);
  assert.deepEqual(await key("+", "1"), [300, 200, 1]);
  assert.ok(Math.abs(((await key("0"))[2] as number) - fit) < 0.001);
  const pinch = async () => {
    const session = await page.context().newCDPSession(page);
    const touch = (type: "touchStart" | "touchMove" | "touchEnd", apart: number) =>
      session.send("Input.dispatchTouchEvent", {
        type,
        touchPoints: type === "touchEnd" ? [] : [-1, 1].map((side, id) => ({ x: x + side * apart, y, id })),
      });
    await touch("touchStart", 50);
    await touch("touchMove", 75);
    await touch("touchMove", 100);
    await touch("touchEnd", 0);
  };
  const pinched = await from(pinch);
  assert.ok(Math.abs((pinched[2] as number) - 2) < 0.05, `${pinched}`);
});

test("a zoom arrives where it was meant to, also in small steps, and asks for no tiles on its way", async () => {
  const moving = await bench.open("#file=three.pyr&at=300,200&zoom=0.25&bands=1", {
    ...WIDE,
    reducedMotion: "no-preference",
  });
  bench.site.requests("three.pyr");
  await moving.locator("#map").focus();
  for (const key of ["+", "+"]) await moving.keyboard.press(key);
  assert.equal((await link(moving)).get("zoom"), "1");
  // The tiles of the finest level that were not there; at most one request more for those of a place in between.
  assert.ok(bench.site.requests("three.pyr") <= 2);
  await moving.context().close();
});

test("the page in one file works from a disk, without any server", async () => {
  const local = await bench.open("", WIDE);
  await local.goto(`file://${process.cwd()}/viewer/single.html`);
  await local.locator("input[type=file]").first().setInputFiles(pyramids.path("one"));
  await local.getByRole("heading", { level: 1, name: "one.pyr" }).waitFor();
  await idle(local);
  assert.equal(await local.locator("#scale").isVisible(), true);
  await local.context().close();
});

test("two sides are compared: settings of one file, or two files, with a slider between them", async () => {
  await go(page, "file=three.pyr&bands=1&stretch=0,255&at=300,200&zoom=1");
  await click("Compare");
  assert.equal(await pressed("Compare"), "true");
  await field("Colours").selectOption("magma");
  const told = await link(page);
  assert.deepEqual(
    [told.get("colormap"), told.get("b.colormap"), told.get("b.file"), told.get("swipe")],
    [null, "magma", "three.pyr", "0.5"],
  );
  const split = page.getByRole("slider", { name: "Where the two sides meet" });
  await split.focus();
  for (const [each, expected] of [
    ["ArrowLeft", "0.48"],
    ["ArrowRight", "0.5"],
    ["PageUp", "0.6"],
    ["PageDown", "0.5"],
    ["Home", "0"],
    ["End", "1"],
  ] as const) {
    await page.keyboard.press(each);
    await idle(page);
    assert.equal(await split.getAttribute("aria-valuenow"), String(100 * Number(expected)));
  }
  await page.keyboard.press("Home");
  await page.keyboard.press("PageUp");
  await idle(page);
  const box = (await split.boundingBox()) as { x: number; y: number; height: number };
  await page.mouse.move(box.x + 1, box.y + box.height / 2);
  await page.mouse.down();
  await page.mouse.move(box.x + 101, box.y + box.height / 2, { steps: 3 });
  await page.mouse.up();
  const share = Number((await link(page)).get("swipe"));
  assert.ok(share > 0.2 && share < 0.3, `${share}`);
  await click("Left side");
  assert.equal(await field("Colours").inputValue(), "grey");
  await click("Right side");
  await click("Another file on this side…");
  await page.getByRole("dialog").getByRole("textbox", { name: "Address of a file" }).fill("one.pyr");
  await page.keyboard.press("Enter");
  await page.getByText("three.pyr · one.pyr").waitFor();
  assert.equal((await link(page)).get("b.file"), "one.pyr");
  await click("Compare");
  assert.deepEqual([(await link(page)).get("b.file"), (await link(page)).get("swipe")], [null, null]);
});

test("a line is drawn by the pointer, by keys and by numbers, and its samples are a graph", async () => {
  const { Pyramid } = await import("zmcraster-web");
  await go(page, "file=three.pyr&at=300,200&zoom=1");
  await click("Line");
  const box = (await page.locator("#map").boundingBox()) as { x: number; y: number; width: number; height: number };
  const [x, y] = [Math.round(box.x + box.width / 2), Math.round(box.y + box.height / 2)];
  await page.mouse.move(x, y);
  await page.mouse.down();
  await page.mouse.move(x + 80, y + 60, { steps: 4 });
  await page.mouse.up();
  assert.equal((await link(page)).get("line"), "300,200,380,260");
  const graph = page.getByRole("img", { name: /^Graph of/ });
  assert.match(
    (await graph.getAttribute("aria-label")) as string,
    /^Graph of 101 points over 100 pixels\. Band 1: from \d+ to \d+, mean/,
  );
  for (const [name, value] of [
    ["Start column", "10.5"],
    ["Start row", "20.5"],
    ["End column", "110.5"],
    ["End row", "20.5"],
  ] as const) {
    const number = page.getByRole("spinbutton", { name });
    await number.fill(value);
    await number.press("Enter");
  }
  assert.equal((await link(page)).get("line"), "10.5,20.5,110.5,20.5");
  await page.getByRole("img", { name: /^Graph of 101 points/ }).waitFor();
  await idle(page);
  await click("Copy values");
  const rows = (await page.evaluate(() => navigator.clipboard.readText())).trim().split("\n");
  assert.equal(rows[0], "distance,band 1,band 2,band 3");
  const { data } = await (
    await Pyramid.open(pyramids.bytes("three"))
  ).readWindow(0, { x: 10, y: 20, width: 101, height: 1 });
  assert.deepEqual(
    rows.slice(1),
    Array.from({ length: 101 }, (_, i) => [i, ...data.subarray(3 * i, 3 * i + 3)].join(",")),
  );
  await click("Close the graph");
  assert.equal((await link(page)).get("line"), null);

  await page.locator("#map").focus();
  await page.keyboard.press("l");
  await page.keyboard.press("Enter");
  assert.match((await announced()) as string, /starts here/);
  await page.keyboard.press("ArrowRight");
  await page.keyboard.press("Enter");
  const line = ((await link(page)).get("line") as string).split(",").map(Number) as [number, number, number, number];
  assert.deepEqual([line[2] - line[0], line[3] - line[1]], [80, 0]);
  await page.keyboard.press("Escape");
  assert.equal((await link(page)).get("line"), null);
});

test("what the keyboard points at is told to those who listen", async () => {
  await go(page, "file=one.pyr&at=150,100&zoom=1");
  await page.locator("#map").focus();
  await page.keyboard.press("Shift+ArrowRight");
  await page.locator("#live", { hasText: /^column 151, row 100\. -?\d+$/ }).waitFor({ state: "attached" });
  await page.evaluate(() => ((document.getElementById("live") as HTMLElement).textContent = ""));
  await page.keyboard.press("v");
  await page.locator("#live", { hasText: /^column 151, row 100\. -?\d+$/ }).waitFor({ state: "attached" });
});

test("what the keyboard points at is told once its samples are here, and not before", async () => {
  const fresh = await bench.open("#file=one.pyr&at=32,32&zoom=4", WIDE);
  bench.site.judge = (_, from) => (from > 0 ? "wait" : undefined);
  await fresh.evaluate(() => (location.hash = "file=one.pyr&at=280,180&zoom=4"));
  await fresh.locator("#busy").waitFor();
  await fresh.locator("#map").focus();
  await fresh.keyboard.press("Shift+ArrowRight");
  await fresh.locator("#place", { hasText: "column 281, row 180" }).waitFor();
  await fresh.waitForTimeout(1000);
  assert.equal(await fresh.locator("#live").textContent(), "");
  bench.site.judge = () => undefined;
  bench.site.release();
  await fresh.locator("#live", { hasText: /^column 281, row 180\. -?\d+$/ }).waitFor({ state: "attached" });
  await fresh.context().close();
});

test("a link shows what one saw, and back and forward go through what was changed", async () => {
  await go(
    page,
    "file=three.pyr&at=280,190&zoom=1.5&bands=2&stretch=10,200&colormap=turbo&gamma=1.3&background=plain&line=1,2,300,200",
  );
  const shown = await picture(page);
  const address = page.url();
  const other = await bench.open(`#${new URL(address).hash.slice(1)}`, WIDE);
  assertSame(await picture(other), shown, "the same link");
  assert.equal(await field("Background").inputValue(), "plain");
  await other.context().close();
  await field("Colours").selectOption("viridis");
  await link(page);
  await field("Background").selectOption("chequers");
  await link(page);
  await page.goBack();
  await idle(page);
  assert.equal(await field("Background").inputValue(), "plain");
  await page.goBack();
  await idle(page);
  assert.equal(await field("Colours").inputValue(), "turbo");
  assertSame(await picture(page), shown, "back");
  await page.goForward();
  await idle(page);
  assert.equal(await field("Colours").inputValue(), "viridis");
});

test("files open from the disk, by a drop, and by the list of a server", async () => {
  const [chooser] = await Promise.all([
    page.waitForEvent("filechooser"),
    (await click("Open…"), page.getByRole("dialog").getByRole("button", { name: "Choose a file…" }).click()),
  ]);
  await chooser.setFiles([pyramids.path("one")]);
  await page.getByRole("heading", { level: 1, name: "one.pyr" }).waitFor();
  await idle(page);
  const told = await link(page);
  assert.deepEqual([told.get("local"), told.get("file")], ["one.pyr", null]);
  const fromDisk = await picture(page);
  await go(page, "file=one.pyr");
  assertSame(fromDisk, await picture(page), "from the disk");

  const bytes = Buffer.from(pyramids.bytes("woven")).toString("base64");
  await page.evaluate((text) => {
    const transfer = new DataTransfer();
    const aux =
      "<PAMDataset><PAMRasterBand band='2'><Description>near infrared</Description></PAMRasterBand></PAMDataset>";
    transfer.items.add(new File([Uint8Array.from(atob(text), (each) => each.charCodeAt(0))], "dropped.pyr"));
    transfer.items.add(new File([aux], "dropped.pyr.aux.xml"));
    dispatchEvent(new DragEvent("drop", { dataTransfer: transfer, cancelable: true }));
  }, bytes);
  await page.getByRole("heading", { level: 1, name: "dropped.pyr" }).waitFor();
  await page.getByRole("term").filter({ hasText: "2 near infrared" }).waitFor();

  const files = [
    { name: "Three bands", url: "three.pyr" },
    { name: "<b>One</b>", url: "one.pyr" },
  ];
  bench.site.files.set("api", { bytes: new TextEncoder().encode(JSON.stringify({ files })), type: "application/json" });
  const welcome = await bench.open("", WIDE);
  await welcome.getByRole("link", { name: "<b>One</b>" }).waitFor();
  await welcome.getByRole("link", { name: "Three bands" }).click();
  await welcome.getByRole("heading", { level: 1, name: "Three bands" }).waitFor();
  await idle(welcome);
  assert.equal(
    new URLSearchParams((await welcome.evaluate(() => location.hash)).slice(1)).get("file") ??
      (await link(welcome)).get("file"),
    "three.pyr",
  );
  await welcome.context().close();
  bench.site.files.delete("api");

  const lost = await bench.open("#local=mine.pyr&at=1,1&zoom=1");
  await lost.getByText('The link shows "mine.pyr"').waitFor();
  await lost.context().close();
});

test("a file of another origin opens by the query of the address", async () => {
  const other = new Bench();
  await other.start();
  other.site.files.set("far.pyr", { bytes: pyramids.bytes("one"), shared: true });
  const far = await bench.open(`?file=${other.base}/far.pyr`);
  await far.getByRole("heading", { level: 1, name: "far.pyr" }).waitFor();
  assert.equal((await link(far)).get("file"), `${other.base}/far.pyr`);
  assert.equal(new URL(far.url()).search, "");
  await far.context().close();
  await other.stop();
});

test("link, picture, theme, keys and controls have buttons that do what they say", async () => {
  await go(page, "file=three.pyr&at=300,200&zoom=1");
  await click("Copy link");
  await page.getByText("Link copied").first().waitFor();
  assert.equal(await page.evaluate(() => navigator.clipboard.readText()), page.url());
  const [download] = await Promise.all([page.waitForEvent("download"), click("Save picture")]);
  assert.equal(download.suggestedFilename(), "three.pyr.png");
  assert.equal(
    readFileSync(await download.path())
      .subarray(1, 4)
      .toString(),
    "PNG",
  );
  const page_ = () => page.evaluate(() => getComputedStyle(document.body).backgroundColor);
  const light = await page_();
  await click("Dark theme");
  assert.notEqual(await page_(), light);
  assert.equal(await pressed("Dark theme"), "true");
  await page.reload();
  await idle(page);
  assert.notEqual(await page_(), light, "the choice is kept");
  await click("Dark theme");
  assert.equal(await page_(), light);
  await click("Keys");
  await page.getByRole("dialog", { name: "Keys" }).waitFor();
  await page.keyboard.press("Escape");
  await click("Controls");
  assert.equal(await page.locator("#panel").isVisible(), false);
  assert.equal(await page.getByRole("button", { name: "Controls" }).getAttribute("aria-expanded"), "false");
  await click("Controls");
  assert.equal(await page.locator("#panel").isVisible(), true);
});

test("the keyboard alone reaches every control in turn, and each shows that it has the focus", async () => {
  await go(page, "file=three.pyr&at=300,200&zoom=1&b.file=three.pyr&swipe=0.5&line=1,1,50,50");
  await page.reload();
  await idle(page);
  const seen = new Set<string>();
  const weak: string[] = [];
  for (let i = 0; i < 80; ++i) {
    await page.keyboard.press("Tab");
    const { name, visible, last } = await page.evaluate(() => {
      const element = document.activeElement as HTMLElement;
      const style = (pseudo?: string) => getComputedStyle(element, pseudo).outlineStyle;
      const grip = element.querySelector(".grip");
      const outlines = [style(), style("::after"), grip ? getComputedStyle(grip).outlineStyle : "none"];
      const name =
        element.getAttribute("aria-label") ??
        element.closest("label")?.firstElementChild?.textContent ??
        element.textContent;
      return {
        name: name?.trim() ?? "",
        visible: outlines.some((each) => each !== "none"),
        last: element.tagName === "BODY",
      };
    });
    if (last) break;
    seen.add(name);
    if (!visible) weak.push(name);
  }
  assert.deepEqual(weak, []);
  for (const name of [
    "To the picture",
    "Open…",
    "Compare",
    "Line",
    "Copy link",
    "Save picture",
    "Dark theme",
    "Keys",
    "Controls",
    "Nearer",
    "Farther",
    "Whole raster",
    "1:1, one sample for each pixel",
    "Where the two sides meet",
    "Start column",
    "End row",
    "Copy values",
    "Close the graph",
    "Left side",
    "Right side",
    "One band",
    "Three bands",
    "Red",
    "Opacity",
    "Range",
    "Minimum of Band 1",
    "Maximum of Band 3",
    "Gamma",
    "No data",
    "Background",
    "About the file",
  ])
    assert.ok(seen.has(name), `${name}: ${[...seen].join(", ")}`);
  await page.locator("#map").focus();
  for (const [key, check] of [
    ["?", "Keys"],
    ["o", "Open a pyramid file"],
  ] as const) {
    await page.keyboard.press(key);
    await page.getByRole("dialog", { name: check }).waitFor();
    await page.keyboard.press("Escape");
    await page.locator("#map").focus();
  }
  await page.keyboard.press("c");
  assert.equal(await pressed("Compare"), "false");
  await page.keyboard.press("b");
  assert.equal(await page.locator("#panel").isVisible(), false);
  await page.keyboard.press("b");
});

test("small screens show the picture first, and the controls below it when asked for", async () => {
  const small = await bench.open("#file=three.pyr", {
    viewport: { width: 380, height: 640 },
    hasTouch: true,
    isMobile: true,
  });
  assert.equal(await small.locator("#panel").isVisible(), false);
  await small.getByRole("button", { name: "Controls" }).tap();
  const [map, panel] = await Promise.all([small.locator("#map").boundingBox(), small.locator("#panel").boundingBox()]);
  assert.ok(map && panel && panel.y >= map.y + map.height - 1 && map.height > 150);
  const overflow = await small.evaluate(() => document.documentElement.scrollWidth - innerWidth);
  assert.ok(overflow <= 0, `${overflow}`);
  await small.context().close();
});

for (const colorScheme of ["light", "dark"] as const)
  test(`axe finds nothing to complain of in the ${colorScheme} theme`, async () => {
    const on = await bench.open("", { ...WIDE, colorScheme });
    const check = async (state: string) => assert.deepEqual(await findings(on), [], state);
    await check("welcome");
    await go(on, "file=three.pyr&b.file=one.pyr&swipe=0.5&line=1,1,50,50");
    await check("three bands, two sides, a line");
    await go(on, "file=one.pyr&bands=1&colormap=viridis&nodata=5");
    await on.getByText("About the file").click();
    await check("one band");
    await on.getByRole("button", { name: "Keys" }).click();
    await check("keys");
    await on.keyboard.press("Escape");
    await go(on, "file=nothing.pyr");
    await check("no such file");
    await on.context().close();
  });

test("no page complained", () => assert.deepEqual(bench.complaints, []));
