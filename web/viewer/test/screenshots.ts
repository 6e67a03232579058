// Pictures of the viewer for people, as `zmcraster serve` of a folder shows it: screenshots.js FOLDER TARGET takes
// earth.pyr and geoid.pyr from the one folder, and leaves serve.png, the page of all files, viewer.png,
// viewer-compare.png and viewer-phone.png in the other, and web.jpg, the page of docs/web.md.
import { readFileSync } from "node:fs";
import { join } from "node:path";

import type { BrowserContextOptions } from "playwright-core";

import { Bench, idle } from "./support/browser.js";
import { Served } from "./support/served.js";

const [folder, target] = process.argv.slice(2) as [string, string];
const bench = new Bench();
const served = new Served();

const EARTH = "file=files/earth.pyr&at=1024,512&zoom=0.53";
const GEOID = "file=files/geoid.pyr&bands=1&colormap=viridis";

async function shoot(
  name: string,
  link: string,
  options: BrowserContextOptions,
  point?: [number, number],
): Promise<void> {
  const page = await bench.visit(`${served.url}/${link && `#${link}`}`, options);
  await idle(page);
  if (point) await page.mouse.move(...point);
  await page.waitForTimeout(300);
  await idle(page);
  await page.waitForFunction(() =>
    [...document.querySelectorAll("#welcome:not([hidden]) .thumb")].every((each) => each.querySelector("img")),
  );
  await page.screenshot({ path: join(target, name) });
  await page.context().close();
}

async function example(): Promise<void> {
  bench.putExample(Uint8Array.from(readFileSync(join(folder, "earth.pyr"))));
  const page = await bench.visit(`${bench.base}/page.html`, { viewport: { width: 1040, height: 528 } });
  await page.waitForFunction(() => document.title === "A pyramid" && document.querySelector("canvas")?.width === 1024);
  await page.screenshot({ path: join(target, "web.jpg"), type: "jpeg", quality: 80 });
  await page.context().close();
}

try {
  await bench.start();
  await served.start(folder);
  const wide = { viewport: { width: 1440, height: 900 } };
  await shoot("serve.png", "", { viewport: { width: 1100, height: 460 } }, [400, 200]);
  await shoot("viewer.png", GEOID, wide, [760, 420]);
  const line = "line=300,330,1760,620";
  const compare = `${EARTH}&b.file=files/geoid.pyr&b.bands=1&b.colormap=turbo&swipe=0.55&${line}`;
  await shoot("viewer-compare.png", compare, { ...wide, colorScheme: "dark" });
  await example();
  await shoot("viewer-phone.png", GEOID, { viewport: { width: 390, height: 780 }, deviceScaleFactor: 2 });
} finally {
  await bench.stop();
  await served.stop();
}
if (bench.complaints.length) throw new Error(bench.complaints.join("\n"));
