// Pages in Chromium: how long each takes, with nothing kept, until all that is in view is drawn, and what it asks for.
//
//     node first_picture.mjs NODE_MODULES < JSON
//
// { pages: [{ name, url, kind, raster }], rounds, chromium, width, height, screenshots }: `kind` tells how a page says
// that it is done, `raster` what stands in the addresses of requests for pixels. Rounds go through all pages in turns,
// each in a browser of its own. The last page of kind "viewer" tells how long a change of style takes too.
import { createRequire } from "node:module";
import { readFileSync } from "node:fs";
import { join } from "node:path";

const { chromium } = createRequire(join(process.argv[2], "bench.js"))("playwright-core");
const { pages, rounds, chromium: executablePath, width, height, screenshots } = JSON.parse(readFileSync(0, "utf8"));
// Software for what a graphics processor would do, for all alike.
const args = ["--no-sandbox", "--use-gl=angle", "--use-angle=swiftshader", "--enable-unsafe-swiftshader"];

// In the page, before anything of its own: `done` is the moment after the last part of the view was drawn, and one
// more frame has been made, so that the picture is on the screen.
function watch(kind) {
  const whole = new Promise((resolve) => {
    globalThis.whole = resolve;
  });
  const frame = () => new Promise((resolve) => requestAnimationFrame(resolve));
  globalThis.done = (async () => {
    if (kind === "viewer") {
      while (!globalThis.viewer) await new Promise((resolve) => setTimeout(resolve, 2));
      await globalThis.viewer.idle();
    } else await whole;
    await frame();
    await frame();
    return performance.now();
  })();
}

async function count(page) {
  const session = await page.context().newCDPSession(page);
  const seen = [];
  const byId = new Map();
  await session.send("Network.enable");
  session.on("Network.requestWillBeSent", ({ requestId, request }) => {
    if (!request.url.startsWith("http")) return;
    const each = { url: request.url, range: request.headers.Range, bytes: 0 };
    seen.push(each);
    byId.set(requestId, each);
  });
  session.on("Network.loadingFinished", ({ requestId, encodedDataLength }) => {
    if (byId.has(requestId)) byId.get(requestId).bytes = encodedDataLength;
  });
  return seen;
}

const restyle = () => {
  const viewer = globalThis.viewer;
  const [side] = viewer.sides;
  const before = side.style;
  const time = (style) => {
    const start = performance.now();
    side.style = style;
    viewer.time();
    return performance.now() - start;
  };
  const stretched = (i) => ({
    ...before,
    ranges: Object.fromEntries(
      Object.entries(before.ranges).map(([band, { minimum, maximum }]) => [
        band,
        { minimum: minimum + (i % 7), maximum: maximum - (i % 5) },
      ]),
    ),
  });
  const mapped = (i) => ({ ...before, bands: [before.bands[0]], colors: ["viridis", "turbo", "magma"][i % 3] });
  const turns = Array.from({ length: 30 }, (_, i) => i);
  for (const i of [0, 1, 2]) time(mapped(i));
  const result = { stretch: turns.map((i) => time(stretched(i))), colours: turns.map((i) => time(mapped(i))) };
  side.style = before;
  const { width, height } = viewer.picture();
  return { ...result, width, height };
};

async function visit({ name, url, kind, raster }, last) {
  const browser = await chromium.launch({ executablePath, headless: true, args });
  try {
    const context = await browser.newContext({ viewport: { width, height }, reducedMotion: "reduce" });
    const page = await context.newPage();
    const problems = [];
    page.on("pageerror", (error) => problems.push(String(error)));
    await page.addInitScript(watch, kind);
    const seen = await count(page);
    await page.goto(url, { waitUntil: "commit" });
    const late = new Promise((_, reject) =>
      setTimeout(() => reject(new Error(`${name}: no picture after a minute; ${problems}`)), 60000).unref(),
    );
    const milliseconds = await Promise.race([page.evaluate("globalThis.done"), late]);
    const before = [...seen];
    if (problems.length) throw new Error(`${name}: ${problems[0]}`);
    await page.waitForTimeout(50); // sizes are told a little later
    const ofRaster = before.filter((each) => each.url.includes(raster));
    const bytes = (list) => list.reduce((sum, each) => sum + each.bytes, 0);
    const result = {
      name,
      milliseconds,
      requests: before.length,
      bytes: bytes(before),
      rasterRequests: ofRaster.length,
      rasterBytes: bytes(ofRaster),
      asked: before.map(({ url, range, bytes }) => [url, range ?? "", bytes]),
    };
    if (last && screenshots) await page.screenshot({ path: join(screenshots, `${name}.png`.replaceAll(/[^\w.]+/g, "_")) });
    if (last && kind === "viewer") {
      await page.waitForTimeout(500);
      const asked = seen.length;
      result.style = await page.evaluate(restyle);
      await page.waitForTimeout(200);
      result.style.requests = seen.length - asked;
    }
    return result;
  } finally {
    await browser.close();
  }
}

const results = [];
for (let round = 0; round < rounds; ++round)
  for (const page of pages) results.push(await visit(page, round === rounds - 1));
console.log(JSON.stringify(results));
