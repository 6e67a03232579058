// A real browser with the viewer in it.
import assert from "node:assert/strict";
import { readFileSync } from "node:fs";

import axe from "axe-core";
import { type Browser, type BrowserContextOptions, chromium, type Page } from "playwright-core";

import type { App } from "../../src/app.js";
import type { Picture } from "./model.js";
import { Site } from "./site.js";

declare const viewer: App;

/** Software for what a graphics processor would do: these tests run where there is none. */
const ARGUMENTS = ["--no-sandbox", "--use-gl=angle", "--use-angle=swiftshader", "--enable-unsafe-swiftshader"];

export class Bench {
  readonly site = new Site();
  base = "";
  private browser: Browser | undefined;
  /** What pages complained of. */
  readonly complaints: string[] = [];

  async start(): Promise<void> {
    for (const [name, type] of [
      ["index.html", "text/html"],
      ["viewer.js", "text/javascript"],
      ["viewer.css", "text/css"],
    ] as const)
      this.site.files.set(name, { bytes: Uint8Array.from(readFileSync(`viewer/dist/${name}`)), type });
    this.base = await this.site.start();
    const executablePath = process.env["CHROMIUM"] ?? "/usr/bin/chromium-headless-shell";
    this.browser = await chromium.launch({ executablePath, headless: true, args: ARGUMENTS });
  }

  async stop(): Promise<void> {
    await this.browser?.close();
    this.site.stop();
  }

  put(name: string, bytes: Uint8Array): void {
    this.site.files.set(name, { bytes });
  }

  /** The page of the documents, page.html, as it stands, with what it asks for. */
  putExample(scene: Uint8Array): void {
    const put = (name: string, type: string, from: string): unknown =>
      this.site.files.set(name, { bytes: Uint8Array.from(readFileSync(from)), type });
    put("page.html", "text/html", "examples/page.html");
    put("zmcraster-web.js", "text/javascript", "dist/index.js");
    this.put("scene.pyr", scene);
  }

  /** A page that shows the viewer, with what stands behind its name in the address. */
  async open(address = "", options: BrowserContextOptions = {}): Promise<Page> {
    const page = await this.visit(`${this.base}/index.html${address}`, options);
    await idle(page);
    return page;
  }

  /** Any page. */
  async visit(url: string, options: BrowserContextOptions = {}): Promise<Page> {
    const context = await (this.browser as Browser).newContext({
      viewport: { width: 640, height: 480 },
      reducedMotion: "reduce",
      ...options,
    });
    const page = await context.newPage();
    page.setDefaultTimeout(15000);
    page.on("pageerror", (error) => this.complaints.push(String(error)));
    await page.goto(url);
    return page;
  }
}

interface Finding {
  id: string;
  nodes: { html: string; failureSummary?: string }[];
}

/** What axe complains of. */
export async function findings(on: Page): Promise<Finding[]> {
  await on.evaluate(axe.source);
  return on.evaluate(async () => {
    const run = (globalThis as unknown as { axe: { run(): Promise<{ violations: Finding[] }> } }).axe.run;
    return (await run()).violations.map(({ id, nodes }) => ({
      id,
      nodes: nodes.map(({ html, failureSummary }) => ({ html, failureSummary: failureSummary ?? "" })),
    }));
  });
}

/** Once all that is in view has come; what sidecars tell as well, if they are waited for. */
export async function idle(page: Page, sidecars = true): Promise<void> {
  await page.waitForFunction(() => "viewer" in globalThis);
  await page.waitForFunction((sidecars) => viewer.idle(sidecars).then(() => true), sidecars);
}

/** Goes to another view by its link, without loading the page anew. */
export async function go(page: Page, link: string, sidecars = true): Promise<void> {
  await page.evaluate((hash) => (location.hash = hash), link);
  await page.waitForTimeout(20);
  await idle(page, sidecars);
}

/** The picture as the graphics processor made it; colours are multiplied by alpha. */
export async function picture(page: Page): Promise<Picture> {
  const { width, height, text } = await page.evaluate(() => {
    const { width, height, pixels } = viewer.picture();
    let text = "";
    for (let i = 0; i < pixels.length; i += 8192) text += String.fromCharCode(...pixels.subarray(i, i + 8192));
    return { width, height, text: btoa(text) };
  });
  return { width, height, pixels: Uint8Array.from(Buffer.from(text, "base64")) };
}

/** What the address tells, once all is here. */
export async function link(page: Page): Promise<URLSearchParams> {
  await idle(page);
  await page.evaluate(() => viewer.writeLink());
  return new URLSearchParams(new URL(page.url()).hash.slice(1));
}

/** Fails where pictures differ by more than a step of 255. */
export function assertSame(actual: Picture, expected: Picture, what: string): void {
  assert.deepEqual([actual.width, actual.height], [expected.width, expected.height], what);
  let [worst, at, drawn] = [0, 0, 0];
  for (let i = 0; i < expected.pixels.length; ++i) {
    const difference = Math.abs((actual.pixels[i] as number) - (expected.pixels[i] as number));
    if (difference > worst) [worst, at] = [difference, i];
    if (i % 4 === 3 && expected.pixels[i]) ++drawn;
  }
  const pixel = at >> 2;
  const place = `${pixel % expected.width}, ${Math.floor(pixel / expected.width)}`;
  const from = (4 * pixel) | 0;
  const both = [actual, expected].map(({ pixels }) => pixels.subarray(from, from + 4).join(" "));
  assert.ok(worst <= 1, `${what}: ${worst} steps at ${place}: ${both.join(" for ")}`);
  assert.ok(drawn > 100, `${what}: there is nothing in the picture`);
}
