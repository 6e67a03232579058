// Makes dist/, a module for each entry; with --tests, the tests in build/test too. Types are left to tsc.
import { build } from "esbuild";
import { existsSync, readdirSync, rmSync } from "node:fs";

const common = { bundle: true, format: "esm", target: "es2022", logLevel: "warning" };
const entry = (name) => `src/${name}.ts`;
const entries = ["index", "node", "openlayers", "openseadragon"].filter((name) => existsSync(entry(name)));

if (!process.argv.includes("--tests")) rmSync("dist", { recursive: true, force: true });
for (const name of entries)
  await build({
    ...common,
    entryPoints: [entry(name)],
    outfile: `dist/${name}.js`,
    minify: true,
    // The other entries share the classes of the first.
    external: name === "index" ? [] : ["./index.js", "node:*", "ol/*"],
  });

if (process.argv.includes("--tests")) {
  rmSync("build/test", { recursive: true, force: true });
  const tests = readdirSync("test").filter((name) => name.endsWith(".test.ts"));
  await build({
    ...common,
    entryPoints: tests.map((name) => `test/${name}`),
    outdir: "build/test",
    platform: "node",
    packages: "external",
  });
}
