// Makes the viewer three times: viewer/dist/, a page with a script and a style, for servers; viewer/served/, the same with
// a script for the first picture, for the program's own server, which makes it; and viewer/single.html, all in one
// file, which can be opened from a disk too. A policy lets the browser run these and nothing else. With --tests,
// the tests in build/viewer too. Started from the folder above.
import { build } from "esbuild";
import { createHash } from "node:crypto";
import { existsSync, mkdirSync, readdirSync, readFileSync, rmSync, writeFileSync } from "node:fs";

// In a folder of a build's own, where run-tests has copied it, or in the tree.
const maps = existsSync("colormaps.txt") ? "./colormaps.txt" : "../render/colormaps.txt";
const alias = { "colormaps.txt": maps };
const common = { bundle: true, target: "es2022", logLevel: "warning", legalComments: "none", charset: "utf8", alias };
const made = async (entry, options) => {
  const { outputFiles } = await build({ ...common, entryPoints: [entry], minify: true, write: false, ...options });
  return outputFiles[0].text.trim();
};
const hash = (text) => `'sha256-${createHash("sha256").update(text).digest("base64")}'`;

const script = await made("viewer/src/main.ts", { format: "iife" });
const first = await made("viewer/src/first.ts", { format: "iife" });
const style = await made("viewer/style.css", {});
const policyOf = (script, style) =>
  [
    "default-src 'none'",
    `script-src ${script}`,
    `style-src ${style}`,
    "img-src data: blob:",
    "connect-src *",
    "base-uri 'none'",
    "form-action 'none'",
    "require-trusted-types-for 'script'",
    "trusted-types sidecar",
  ].join("; ");

// Of the one library inside, and of the parts of it that have packages of their own.
const licence = ["proj4/LICENSE.md", "mgrs/license.md", "wkt-parser/LICENSE.md"]
  .map((name) => readFileSync(`node_modules/${name}`, "utf8").trim())
  .join("\n\n");

const page = (policy, styleElement, firstElement, scriptElement) =>
  readFileSync("viewer/index.html", "utf8")
    .replace("{policy}", () => policy)
    .replace("<!-- style -->", () => styleElement)
    .replace(/ *<!-- first -->\n/, () => firstElement)
    .replace("<!-- script -->", () => scriptElement)
    .concat(`<!--\n${licence}\n-->\n`);
for (const [folder, own] of [
  ["viewer/dist", {}],
  ["viewer/served", { "first.js": first }],
]) {
  rmSync(folder, { recursive: true, force: true });
  mkdirSync(folder);
  const firstElement = Object.keys(own).map((name) => `    <script src="${name}"></script>\n`);
  const link = '<link rel="stylesheet" href="viewer.css" />';
  const whole = page(policyOf("'self'", "'self'"), link, firstElement.join(""), '<script src="viewer.js"></script>');
  for (const [name, text] of Object.entries({ "index.html": whole, "viewer.js": script, "viewer.css": style, ...own }))
    writeFileSync(`${folder}/${name}`, text);
}
writeFileSync(
  "viewer/single.html",
  page(policyOf(hash(script), hash(style)), `<style>${style}</style>`, "", `<script>${script}</script>`),
);

if (process.argv.includes("--tests")) {
  rmSync("build/viewer", { recursive: true, force: true });
  const tests = readdirSync("viewer/test").filter((name) => name.endsWith(".ts"));
  await build({
    ...common,
    format: "esm",
    entryPoints: tests.map((name) => `viewer/test/${name}`),
    outdir: "build/viewer",
    platform: "node",
    packages: "external",
  });
}
