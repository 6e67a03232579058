// Pictures of the viewer for people: screenshots.js FOLDER TARGET takes earth.pyr and geoid.pyr from the one folder,
// and leaves viewer.png, viewer-compare.png and viewer-phone.png in the other.
import { readFileSync } from "node:fs";
import { join } from "node:path";

import type { BrowserContextOptions } from "playwright-core";

import { Bench, idle } from "./support/browser.js";

const [folder, target] = process.argv.slice(2) as [string, string];
const bench = new Bench();

const EARTH = "file=earth.pyr&at=1024,512&zoom=0.53";
const GEOID = "file=geoid.pyr&bands=1&colormap=viridis";

async function shoot(
  name: string,
  link: string,
  options: BrowserContextOptions,
  point?: [number, number],
): Promise<void> {
  const page = await bench.open(`#${link}`, options);
  if (point) await page.mouse.move(...point);
  await page.waitForTimeout(300);
  await idle(page);
  await page.screenshot({ path: join(target, name) });
  await page.context().close();
}

try {
  await bench.start();
  for (const name of ["earth.pyr", "geoid.pyr"]) bench.put(name, Uint8Array.from(readFileSync(join(folder, name))));
  const wide = { viewport: { width: 1440, height: 900 } };
  await shoot("viewer.png", GEOID, wide, [760, 420]);
  const line = "line=300,330,1760,620";
  const compare = `${EARTH}&b.file=geoid.pyr&b.bands=1&b.colormap=turbo&swipe=0.55&${line}`;
  await shoot("viewer-compare.png", compare, { ...wide, colorScheme: "dark" });
  await shoot("viewer-phone.png", GEOID, { viewport: { width: 390, height: 780 }, deviceScaleFactor: 2 });
} finally {
  await bench.stop();
}
if (bench.complaints.length) throw new Error(bench.complaints.join("\n"));
