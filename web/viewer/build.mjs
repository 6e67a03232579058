// Makes viewer/dist/index.html: the whole viewer in one file, with its script and style inside, and a policy that lets
// the browser run these and nothing else. With --tests, the tests in build/viewer too. Started from the folder above.
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
const style = await made("viewer/style.css", {});
const policy = [
  "default-src 'none'",
  `script-src ${hash(script)}`,
  `style-src ${hash(style)}`,
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

const page = readFileSync("viewer/index.html", "utf8")
  .replace("{policy}", () => policy)
  .replace("<!-- style -->", () => `<style>${style}</style>`)
  .replace("<!-- script -->", () => `<script>${script}</script>`)
  .concat(`<!--\n${licence}\n-->\n`);
mkdirSync("viewer/dist", { recursive: true });
writeFileSync("viewer/dist/index.html", page);

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
