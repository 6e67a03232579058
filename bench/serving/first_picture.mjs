// Pages in Chromium: how long each takes, with nothing kept, until all that is in view is drawn, and what it asks for.
//
//     node first_picture.mjs NODE_MODULES < JSON
//
// { pages: [{ name, url, kind, raster }], rounds, chromium, width, height, screenshots }: `kind` tells how a page says
// that it is done ("viewer" says both when the server's picture of the whole view is on the screen, and when the samples
// themselves have taken its place), `raster` what stands in the addresses of requests for pixels. Rounds go through all pages in turns,
// each in a browser of its own. The last page of kind "viewer" tells how long a change of style takes too.
import { createRequire } from "node:module";
import { readFileSync } from "node:fs";
import { join } from "node:path";

const { chromium } = createRequire(join(process.argv[2], "bench.js"))("playwright-core");
const { pages, rounds, chromium: executablePath, width, height, screenshots } = JSON.parse(readFileSync(0, "utf8"));
// Software for what a graphics processor would do, for all alike.
const args = ["--no-sandbox", "--use-gl=angle", "--use-angle=swiftshader", "--enable-unsafe-swiftshader"];

// In the page, before anything of its own: `done` is the moment after the last part of the view was drawn, and two more
// frames have been made, so that the picture is on the screen; `first` the same of a picture of the whole view that
// was there before, in the resolution of what is drawn then, if there was one.
function watch(kind) {
  const whole = new Promise((resolve) => {
    globalThis.whole = resolve;
  });
  const frame = () => new Promise((resolve) => requestAnimationFrame(resolve));
  const early = async () => {
    for (;;) {
      const image = document.getElementById("first-picture");
      if (image) return image;
      if (globalThis.drawn) return undefined;
      await new Promise((resolve) => setTimeout(resolve, 2));
    }
  };
  globalThis.first =
    kind === "viewer" &&
    early().then(async (image) => {
      if (!image) return undefined;
      await frame();
      await frame();
      const { width, height } = image.getBoundingClientRect();
      const by = devicePixelRatio;
      // Those of the level that the samples are drawn from, which is the nearest in size to the pixels of the screen.
      if (image.naturalWidth < 0.7 * width * by || image.naturalHeight < 0.7 * height * by)
        throw new Error("the first picture has not the resolution of the screen");
      const milliseconds = performance.now();
      // What the browser itself tells, which is later where it is not done with the frame.
      const presented = await new Promise((resolve) => {
        new PerformanceObserver((list) => resolve(list.getEntries()[0].renderTime)).observe({ type: "element", buffered: true });
        setTimeout(resolve, 5000);
      });
      return { milliseconds, presented, width: image.naturalWidth, height: image.naturalHeight };
    });
  globalThis.done = (async () => {
    if (kind === "viewer") {
      while (!globalThis.viewer) await new Promise((resolve) => setTimeout(resolve, 2));
      await globalThis.viewer.idle();
    } else await whole;
    await frame();
    await frame();
    globalThis.drawn = true;
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
  const time = (style, grain) => {
    const start = performance.now();
    side.style = style;
    viewer.time(grain);
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
  // As a change is seen at first where all pixels take longer than a frame: every second one of every second line.
  time(stretched(0), 2);
  result["stretch, at first"] = turns.map((i) => time(stretched(i), 2));
  result["colours, at first"] = turns.map((i) => time(mapped(i), 2));
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
    const drawn = await Promise.race([page.evaluate("globalThis.done"), late]);
    const first = await page.evaluate("globalThis.first");
    const before = [...seen];
    if (problems.length) throw new Error(`${name}: ${problems[0]}`);
    await page.waitForTimeout(50); // sizes are told a little later
    const ofRaster = before.filter((each) => each.url.includes(raster));
    const bytes = (list) => list.reduce((sum, each) => sum + each.bytes, 0);
    const result = {
      name,
      milliseconds: first?.milliseconds ?? drawn,
      drawn,
      first,
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
