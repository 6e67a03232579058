// Slow servers, failing ones, files that are none or are replaced, and files that would like to be a page.
import assert from "node:assert/strict";
import { after, before, beforeEach, test } from "node:test";

import type { Page } from "playwright-core";
import { Pyramid } from "zmcraster-web";

import { documentOf, fileOf, headerOf, Pyramids } from "../../test/support/pyramids.js";
import type { App } from "../src/app.js";
import { assertSame, Bench, go, idle, link, picture } from "./support/browser.js";
import { draw } from "./support/model.js";

declare const viewer: App;

const bench = new Bench();
const pyramids = new Pyramids();
let page: Page;
let pyramid: Pyramid;

// Tiles of 64 kB, so that those of a level are several requests: what lies between them is not asked for.
const header = headerOf({ PIXEL_WIDTH: 2048, PIXEL_HEIGHT: 1024, TILESIZE: 256, LEVELMAX: 3, BANDS: 1 });

before(async () => {
  await bench.start();
  pyramids.make([
    { name: "large", seed: 1, header },
    { name: "other", seed: 2, header },
  ]);
  pyramid = await Pyramid.open(pyramids.bytes("large"));
  page = await bench.open();
});
beforeEach(() => {
  bench.put("large.pyr", pyramids.bytes("large"));
  bench.site.judge = () => undefined;
  bench.site.log.length = 0;
});
after(async () => {
  await bench.stop();
  pyramids.remove();
});

const STYLE = "bands=1&stretch=0,255";
const style = { bands: [0], ranges: [[0, 255]] as [number, number][] };
const problem = () => page.locator("#problem");

/** Where the tiles of a level begin in the file. */
const startOf = (level: number): number =>
  pyramid.tileDataStart +
  pyramid.levels.filter((each) => each.level > level).reduce((sum, { width, height }) => sum + width * height, 0);

/** Once that is so; fails if it is not within ten seconds. */
async function until(what: string, holds: () => boolean): Promise<void> {
  for (const end = Date.now() + 10000; !holds();) {
    assert.ok(Date.now() < end, `never: ${what}`);
    await new Promise((resolve) => setTimeout(resolve, 5));
  }
}

/** Once a request for the file has come that `of` counts. */
const requested = (of: (from: number) => boolean): Promise<void> =>
  until("a request", () => bench.site.log.some(({ path, from }) => path === "large.pyr" && of(from)));

test("the first picture takes three requests for a file without records: header, coarsest tile, tiles of the view", async () => {
  // With and without the controls beside it, the picture would be of different levels: they are there from the start.
  const fresh = await bench.open("#file=large.pyr", { viewport: { width: 1800, height: 1000 } });
  const asked = bench.site.log.filter(({ path }) => /\.pyr/.test(path));
  const files = asked.filter(({ path }) => path === "large.pyr").map(({ from }) => from);
  // That there are no records behind its tiles its size tells.
  assert.deepEqual(files, [0, startOf(3), startOf(1)]);
  assert.deepEqual(
    asked.filter(({ path }) => path !== "large.pyr").map(({ path }) => path),
    ["large.pyr.aux.xml"],
  );
  await fresh.context().close();
});

test("coarse tiles are shown until the fine ones are there, and it is told that they are on their way", async () => {
  await go(page, `file=large.pyr&${STYLE}&at=1024,512&zoom=0.125`);
  bench.site.judge = (_, from) => (from < startOf(2) ? undefined : "wait");
  await page.evaluate((hash) => (location.hash = hash), `file=large.pyr&${STYLE}&at=1024,512&zoom=1`);
  await requested((from) => from >= startOf(0));
  await page.locator("#busy").waitFor();
  const { width, height, ...coarse } = await picture(page);
  const place = { x: 1024, y: 512, zoom: 1 };
  assertSame(
    { width, height, ...coarse },
    await draw(pyramid, { width, height }, { ...place, level: 3 }, style),
    "coarse",
  );
  bench.site.release();
  bench.site.judge = () => undefined;
  await idle(page);
  assert.equal(await page.locator("#busy").isVisible(), false);
  assertSame(await picture(page), await draw(pyramid, { width, height }, { ...place, level: 0 }, style), "fine");
});

test("requests for tiles that have left the view are ended", async () => {
  await go(page, `file=other.pyr`);
  await go(page, `file=large.pyr&${STYLE}&at=300,300&zoom=0.125`);
  bench.site.judge = (_, from) => (from >= startOf(0) ? "wait" : undefined);
  const before = bench.site.left;
  await page.evaluate((hash) => (location.hash = hash), `file=large.pyr&${STYLE}&at=300,100&zoom=2`);
  await requested((from) => from >= startOf(0));
  await page.evaluate((hash) => (location.hash = hash), `file=large.pyr&${STYLE}&at=1700,900&zoom=2`);
  await until("an end", () => bench.site.left > before);
  bench.site.judge = () => undefined;
  bench.site.release();
  await idle(page);
  const { width, height, pixels } = await picture(page);
  const view = { x: 1700, y: 900, zoom: 2, level: 0 };
  assertSame({ width, height, pixels }, await draw(pyramid, { width, height }, view, style), "the new place");
});

test("textures stay within their bound: a view that would take more is drawn from a coarser level", async () => {
  await go(page, `file=other.pyr`);
  await go(page, `file=large.pyr&${STYLE}&at=1024,512&zoom=0.125`);
  const limit = 11 * 65536;
  const bytes = await page.evaluate(async (limit) => {
    const [{ store }] = (viewer as unknown as { sides: [{ store: { limit: number; state: { bytes: number } } }] })
      .sides;
    store.limit = limit;
    let most = 0;
    for (const [x, y] of [
      [256, 256],
      [1800, 256],
      [256, 900],
      [1024, 512],
    ]) {
      location.hash = `file=large.pyr&bands=1&stretch=0,255&at=${x},${y}&zoom=1`;
      await new Promise((resolve) => setTimeout(resolve, 20));
      await viewer.idle();
      most = Math.max(most, store.state.bytes);
    }
    return most;
  }, limit);
  assert.ok(bytes > limit / 2 && bytes <= limit, `${bytes}`);
  const { width, height, pixels } = await picture(page);
  const view = { x: 1024, y: 512, zoom: 1, level: 1 };
  assertSame({ width, height, pixels }, await draw(pyramid, { width, height }, view, style), "the coarser level");
});

test("tiles seen before come without a request", async () => {
  await go(page, `file=large.pyr&${STYLE}&at=300,300&zoom=1`);
  await go(page, `file=large.pyr&${STYLE}&at=1500,700&zoom=1`);
  bench.site.log.length = 0;
  await go(page, `file=large.pyr&${STYLE}&at=300,300&zoom=1`);
  assert.deepEqual(bench.site.log, []);
});

test("tiles that cannot be had are told, with a button that asks again", async () => {
  const fresh = await bench.open(`#file=large.pyr&${STYLE}&at=1024,512&zoom=0.125`);
  bench.site.judge = (_, from) => (from >= startOf(0) ? 404 : undefined);
  await go(fresh, `file=large.pyr&${STYLE}&at=1024,512&zoom=1`);
  const toast = fresh.getByRole("alert").filter({ hasText: "could not be had" });
  await toast.waitFor();
  assert.match((await toast.textContent()) as string, /^\d+ tiles could not be had: .*the server answered 404/);
  bench.site.judge = () => undefined;
  await toast.getByRole("button", { name: "Try again" }).click();
  await idle(fresh);
  assert.equal(await toast.isVisible(), false);
  const { width, height, pixels } = await picture(fresh);
  assertSame(
    { width, height, pixels },
    await draw(pyramid, { width, height }, { x: 1024, y: 512, zoom: 1, level: 0 }, style),
    "again",
  );
  await fresh.context().close();
});

test("a server that fails for a moment is asked again by itself", async () => {
  let left = 1;
  bench.site.judge = (path) => (path === "large.pyr" && left-- > 0 ? 503 : undefined);
  const fresh = await bench.open("#file=large.pyr");
  await fresh.locator("#scale").waitFor();
  assert.equal(await fresh.locator("#problem").isVisible(), false);
  await fresh.context().close();
});

test("what is wrong with a file is told in words, and asking again helps once it is there", async () => {
  const bad = async (name: string, bytes: Uint8Array, title: string, detail: RegExp) => {
    bench.put(name, bytes);
    await go(page, `file=${name}`);
    await page.getByRole("heading", { name: title }).waitFor();
    assert.match((await page.locator("#problem-detail").textContent()) as string, detail);
    assert.equal(await page.locator("#problem-name").textContent(), name);
  };
  await bad(
    "text.pyr",
    new TextEncoder().encode("This is a text."),
    "The file cannot be read",
    /it is no pyramid file/,
  );
  await bad(
    "quad.pyr",
    fileOf(documentOf({ ...header, PIXEL_TYPE: "Quad" })),
    "The file cannot be read",
    /pixel type is not known/,
  );
  await bad(
    "bands.pyr",
    fileOf(documentOf({ ...header, BANDS: 70000 })),
    "The file claims too much",
    /70000 bands, beyond the limit/,
  );
  await bad("none.pyr", fileOf(documentOf({ ...header, BANDS: 0 })), "The file cannot be shown", /no pixels to show/);
  await go(page, "file=later.pyr");
  await page.getByRole("heading", { name: "There is no such file" }).waitFor();
  bench.put("later.pyr", pyramids.bytes("large"));
  await page.getByRole("button", { name: "Try again" }).click();
  await idle(page);
  assert.equal(await problem().isVisible(), false);
  assert.equal(await page.locator("#scale").isVisible(), true);
  bench.site.judge = (path) => (path === "later.pyr" ? 403 : undefined);
  await go(page, "file=later.pyr&x");
  await go(page, "file=large.pyr");
  await go(page, "file=later.pyr");
  await page.getByRole("heading", { name: "The server refuses the file" }).waitFor();
  await go(page, "file=http://127.0.0.1:1/nobody.pyr");
  await page.getByRole("heading", { name: "The file cannot be reached" }).waitFor();
  await page.getByRole("button", { name: "Open another file" }).click();
  await page.getByRole("dialog", { name: "Open a pyramid file" }).waitFor();
  await page.keyboard.press("Escape");
});

test("a file that ends too early shows what it has, and says so", async () => {
  bench.put("cut.pyr", pyramids.bytes("large").subarray(0, startOf(0) + 70000));
  await go(page, `file=cut.pyr&${STYLE}&at=1024,512&zoom=0.125`);
  assert.equal(await page.locator("dd", { hasText: "not complete" }).count(), 1);
  const { width, height, pixels } = await picture(page);
  assertSame(
    { width, height, pixels },
    await draw(pyramid, { width, height }, { x: 1024, y: 512, zoom: 0.125, level: 3 }, style),
    "coarse levels",
  );
});

test("records that are malformed are told, and the picture is shown without them", async () => {
  const front = pyramids.bytes("large");
  bench.put("records.pyr", Uint8Array.from([...front, ...new TextEncoder().encode("<DATASET><b>")]));
  await go(page, "file=records.pyr");
  await page.locator("dd", { hasText: "the metadata document is malformed" }).waitFor({ state: "attached" });
});

test("a file that is replaced while it is shown is told, never mixed, and shown anew when asked for", async () => {
  await go(page, "file=other.pyr"); // so that nothing is left of what was seen before
  await go(page, `file=large.pyr&${STYLE}&at=1024,512&zoom=0.125`);
  bench.site.files.set("large.pyr", { bytes: pyramids.bytes("other"), etag: '"2"' });
  await go(page, `file=large.pyr&${STYLE}&at=1024,512&zoom=1`);
  await page.getByRole("heading", { name: "The file has changed" }).waitFor();
  const { width, height, pixels } = await picture(page);
  const view = { x: 1024, y: 512, zoom: 1 };
  assertSame(
    { width, height, pixels },
    await draw(pyramid, { width, height }, { ...view, level: 3 }, style),
    "the old tiles",
  );
  await page.getByRole("button", { name: "Try again" }).click();
  await idle(page);
  assert.equal(await problem().isVisible(), false);
  const other = await Pyramid.open(pyramids.bytes("other"));
  assertSame(await picture(page), await draw(other, { width, height }, { ...view, level: 0 }, style), "the new file");
});

const NASTY = `<script>document.title = "taken"</script><img src=x onerror="document.title='taken'">`;
const escaped = NASTY.replace(/&/g, "&amp;").replace(/</g, "&lt;").replace(/"/g, "&quot;");

test("no text of a file becomes a part of the page", async () => {
  const name = `${NASTY.replace(/\//g, "")}.pyr`;
  const sidecar = `<PAMDataset><SRS>GEOGCS["${escaped}"]</SRS><GeoTransform>0,1,0,0,0,-1</GeoTransform>
    <PAMRasterBand band="1"><Description>${escaped}</Description><UnitType>${escaped}</UnitType><NoDataValue>${escaped}</NoDataValue></PAMRasterBand></PAMDataset>`;
  bench.put(name, pyramids.bytes("large"));
  bench.put(`${name}.aux.xml`, new TextEncoder().encode(sidecar));
  await go(page, `file=${encodeURIComponent(encodeURIComponent(name))}&line=1,1,50,50&at=100,100&zoom=1`);
  await page.locator("dt", { hasText: NASTY }).first().waitFor({ state: "attached" });
  const map = (await page.locator("#map").boundingBox()) as { x: number; y: number };
  await page.mouse.move(map.x + 340, map.y + 130);
  await page.locator("#values dd", { hasText: "<script>" }).waitFor({ state: "attached" });
  assert.equal(await page.locator("#title").textContent(), name);
  assert.equal(await page.locator("script").count(), 1);
  assert.equal(await page.locator("img").count(), 0);
  assert.equal(await page.title(), `${name} – zmcraster`);
  await go(page, `file=${encodeURIComponent(encodeURIComponent(`${NASTY.replace(/\//g, "")}.none`))}`);
  await page.getByRole("heading", { name: "There is no such file" }).waitFor();
  assert.equal(await page.locator("img").count(), 0);
});

test("a sidecar that comes late names bands, and values without data, when it is there", async () => {
  const sidecar = `<PAMDataset><PAMRasterBand band="1"><Description>depth</Description><NoDataValue>7</NoDataValue></PAMRasterBand></PAMDataset>`;
  bench.put("late.pyr", pyramids.bytes("large"));
  bench.put("late.pyr.aux.xml", new TextEncoder().encode(sidecar));
  bench.site.judge = (path) => (path.endsWith(".aux.xml") ? "wait" : undefined);
  await go(page, `file=late.pyr&${STYLE}&at=1024,512&zoom=1`, false);
  const { width, height, pixels } = await picture(page);
  const view = { x: 1024, y: 512, zoom: 1, level: 0 };
  assertSame({ width, height, pixels }, await draw(pyramid, { width, height }, view, style), "before it");
  bench.site.release();
  await page.locator("#values dt", { hasText: "1 depth" }).waitFor({ state: "attached" });
  await idle(page);
  const later = await draw(pyramid, { width, height }, view, { ...style, noData: 7 });
  assertSame(await picture(page), later, "with it");
});

test("a sidecar with a document type is not read, and one that is none changes nothing", async () => {
  bench.put("typed.pyr", pyramids.bytes("large"));
  const text = `<!DOCTYPE a [<!ENTITY b "c">]><PAMDataset><PAMRasterBand band="1"><Description>&b;</Description></PAMRasterBand></PAMDataset>`;
  for (const each of [text, "<PAMDataset><SRS>", "no xml", "<other/>"]) {
    bench.put("typed.pyr.aux.xml", new TextEncoder().encode(each));
    await go(page, "file=large.pyr");
    await go(page, "file=typed.pyr");
    assert.equal(await page.locator("#values dt").textContent(), "Band 1", each);
  }
});

test("the page runs no script but its own, and takes markup from no text", async () => {
  const policy = (await page.locator("meta[http-equiv=Content-Security-Policy]").getAttribute("content")) as string;
  assert.doesNotMatch(policy, /unsafe|script-src [^;]*(\*|http|data:)/);
  const { ran, refused } = await page.evaluate(async () => {
    const violation = new Promise<string>((resolve) =>
      addEventListener("securitypolicyviolation", (event) => resolve(event.violatedDirective), { once: true }),
    );
    let markup = false;
    try {
      document.body.insertAdjacentHTML("beforeend", "<i></i>");
    } catch {
      markup = true;
    }
    const script = document.createElement("script");
    try {
      script.append("globalThis.ran = true");
      document.body.append(script);
    } catch {
      // refused at once
    }
    await Promise.race([violation, new Promise((resolve) => setTimeout(resolve, 500))]);
    return { ran: "ran" in globalThis, refused: markup };
  });
  assert.deepEqual({ ran, refused }, { ran: false, refused: true });
});

test("a link that says nonsense shows the file as it is usual", async () => {
  for (const nonsense of [
    "bands=0,9,x&stretch=a,b&gamma=-1&colormap=none&alpha=77&zoom=0&at=,&swipe=2&line=1,2,3",
    "bands=99&nodata=x&complex=y",
    "zoom=1e999&at=1e999,NaN",
  ]) {
    await go(page, "file=other.pyr");
    await go(page, `file=large.pyr&${nonsense}`);
    assert.equal(await problem().isVisible(), false, nonsense);
    const told = await link(page);
    assert.deepEqual(
      [told.get("bands"), told.get("at"), told.get("line"), told.get("gamma")],
      ["1", "1024,512", null, null],
      nonsense,
    );
  }
});

test("a graphics processor that is lost and comes back shows the picture again", async () => {
  await go(page, `file=large.pyr&${STYLE}&at=1024,512&zoom=1`);
  const before = await picture(page);
  await page.evaluate(async () => {
    const canvas = document.querySelector("#picture") as HTMLCanvasElement;
    const extension = canvas.getContext("webgl2")?.getExtension("WEBGL_lose_context");
    const event = (name: string) => new Promise((resolve) => canvas.addEventListener(name, resolve, { once: true }));
    const lost = event("webglcontextlost");
    extension?.loseContext();
    await lost;
    await new Promise((resolve) => setTimeout(resolve, 50)); // it cannot be restored while that event runs
    const restored = event("webglcontextrestored");
    extension?.restoreContext();
    await restored;
  });
  await page.waitForTimeout(50);
  await idle(page);
  assertSame(await picture(page), before, "restored");
});

test("no page complained", () => assert.deepEqual(bench.complaints, []));
