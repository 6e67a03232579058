// What is packed: its size, its parts, and that they can be used as they are.
import assert from "node:assert/strict";
import { spawnSync } from "node:child_process";
import { mkdirSync, mkdtempSync, readdirSync, readFileSync, rmSync, writeFileSync } from "node:fs";
import { tmpdir } from "node:os";
import { join } from "node:path";
import { test } from "node:test";
import { gzipSync } from "node:zlib";

const MOST = 12000; // bytes of the reader, compressed

test("the reader has less than 12 kB compressed, and no module besides", () => {
  const module = readFileSync("dist/index.js");
  const compressed = gzipSync(module, { level: 9 }).length;
  assert.ok(compressed < MOST, `${compressed} bytes`);
  assert.doesNotMatch(module.toString(), /\bimport\b[^(]*from|\brequire\(|\bprocess\.|\bdocument\./);
});

test("every entry has its module and its types, and nothing is needed at run time", () => {
  const { exports, dependencies } = JSON.parse(readFileSync("package.json", "utf8")) as {
    exports: Record<string, { types: string; default: string }>;
    dependencies?: object;
  };
  assert.equal(dependencies, undefined);
  for (const { types, default: module } of Object.values(exports)) {
    assert.ok(readFileSync(types).length > 0);
    assert.ok(readFileSync(module).length > 0);
  }
});

test("npm packs the entries, their types and the examples, and nothing else", () => {
  const npm = spawnSync("npm", ["pack", "--dry-run", "--json", "--ignore-scripts", "--offline"], { encoding: "utf8" });
  assert.equal(npm.status, 0, npm.stderr);
  const answer = JSON.parse(npm.stdout) as
    { files: { path: string }[] }[] | Record<string, { files: { path: string }[] }>;
  const [{ files }] = Object.values(answer) as [{ files: { path: string }[] }];
  const paths = files.map(({ path }) => path).sort();
  assert.ok(paths.includes("dist/index.js") && paths.includes("dist/index.d.ts") && paths.includes("README.md"));
  for (const path of paths)
    assert.match(path, /^(dist\/[\w.]+\.(js|d\.ts)|examples\/[\w.]+|package\.json|README\.md)$/);
});

test("a project of others uses what is packed, in JavaScript and with its types alone", () => {
  const folder = mkdtempSync(join(tmpdir(), "zmcraster-web-"));
  try {
    const run = (command: string, ...rest: string[]): string => {
      const { status, stdout, stderr } = spawnSync(command, rest, { cwd: folder, encoding: "utf8" });
      assert.equal(status, 0, `${command}: ${stdout}${stderr}`);
      return stdout;
    };
    const npm = ["pack", "--ignore-scripts", "--offline", "--pack-destination", folder];
    assert.equal(spawnSync("npm", npm, { encoding: "utf8" }).status, 0);
    const home = join(folder, "node_modules/zmcraster-web");
    mkdirSync(home, { recursive: true });
    const packed = readdirSync(folder).find((name) => name.endsWith(".tgz")) as string;
    run("tar", "-xzf", packed, "--strip-components=1", "-C", home);
    writeFileSync(join(folder, "package.json"), '{ "type": "module" }');
    const use = 'import { FormatError, Pyramid } from "zmcraster-web";\n';
    const body = "const error = await Pyramid.open(new Uint8Array(3)).catch((reason) => reason);\n";
    writeFileSync(join(folder, "use.js"), `${use}${body}console.log(error instanceof FormatError);\n`);
    assert.equal(run(process.execPath, "use.js"), "true\n");
    const typed =
      "const { data } = await (await Pyramid.open('x')).readTile<'UInt64'>(0, 0, 0);\nconst first: bigint = data[0]!;\n";
    writeFileSync(join(folder, "use.ts"), `${use}${typed}console.log(first, FormatError);\n`);
    const tsc = [
      "--noEmit",
      "--strict",
      "--target",
      "es2022",
      "--module",
      "nodenext",
      "--lib",
      "es2022,dom",
      "--types",
      "",
    ];
    run(join(process.cwd(), "node_modules/.bin/tsc"), ...tsc, "use.ts");
  } finally {
    rmSync(folder, { recursive: true, force: true });
  }
});

test("the lock file names no registry", () => {
  assert.doesNotMatch(readFileSync("package-lock.json", "utf8"), /"resolved"|https?:\/\/registry/);
});

test("all that is exported is documented", () => {
  const sources = readdirSync("src").map((name) => readFileSync(`src/${name}`, "utf8"));
  const lists = sources.join("\n").matchAll(/^export (?:type )?\{([^}]*)\} from/gm);
  const names = [...lists].flatMap(([, list]) => (list as string).match(/\w+(?=\s*(,|$))/g) ?? []);
  const direct = ["node", "openlayers", "openseadragon"].flatMap((name) => {
    const text = readFileSync(`src/${name}.ts`, "utf8");
    return [...text.matchAll(/^export (?:async )?(?:class|interface|function|const|type) (\w+)/gm)].map(
      ([, each]) => each,
    );
  });
  assert.ok(names.length > 20 && direct.length > 5);
  for (const name of [...names, ...direct]) {
    const declared = new RegExp(`(.*)\\nexport (?:async )?(?:class|interface|function|const|type) ${name}\\b`);
    const found = sources.map((text) => declared.exec(text)?.[1]).filter((line) => line !== undefined);
    assert.deepEqual(
      found.map((line) => line.endsWith("*/")),
      [true],
      `${name}`,
    );
  }
});
