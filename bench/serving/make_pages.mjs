// The pages of others that a first picture is measured beside, as their documents show them, each in its quickest form.
//
//     node make_pages.mjs NODE_MODULES FOLDER
import { createRequire } from "node:module";
import { copyFileSync, mkdirSync, writeFileSync } from "node:fs";
import { join, resolve } from "node:path";

const [modules, folder] = process.argv.slice(2).map((path) => resolve(path));
const { build } = createRequire(join(modules, "bench.js"))("esbuild");
mkdirSync(folder, { recursive: true });
const page = (scripts) => `<!doctype html>
<meta charset="utf-8" />
<title>Beside</title>
<link rel="icon" href="data:," />
<style>html, body, #map { margin: 0; width: 100%; height: 100%; background: #222; }</style>
<div id="map"></div>
${scripts}
`;

copyFileSync(
  join(modules, "openseadragon/build/openseadragon/openseadragon.min.js"),
  join(folder, "openseadragon.min.js"),
);
writeFileSync(
  join(folder, "openseadragon.html"),
  page(`<script src="openseadragon.min.js"></script>
<script>
  const tileSources = new URLSearchParams(location.search).get("source");
  // By itself it asks for one tile a frame, and draws by WebGL, which software does more slowly than a canvas.
  const quickest = { immediateRender: true, maxTilesPerFrame: 64, drawer: "canvas" };
  const viewer = OpenSeadragon({ id: "map", tileSources, showNavigationControl: false, ...quickest });
  viewer.addHandler("open", () => {
    const image = viewer.world.getItemAt(0);
    const look = () => (image.getFullyLoaded() ? whole() : setTimeout(look, 5));
    look();
  });
</script>`),
);

await build({
  stdin: {
    contents: `
      import Map from "ol/Map.js";
      import View from "ol/View.js";
      import TileLayer from "ol/layer/WebGLTile.js";
      import GeoTIFF from "ol/source/GeoTIFF.js";
      const source = new GeoTIFF({ sources: [{ url: new URLSearchParams(location.search).get("source") }] });
      const map = new Map({ target: "map", controls: [], layers: [new TileLayer({ source, transition: 0 })] });
      source.getView().then((options) => {
        const view = new View(options);
        map.setView(view);
        view.fit(options.extent, { size: map.getSize() });
        map.once("rendercomplete", () => globalThis.whole());
      });`,
    resolveDir: resolve(modules, ".."),
  },
  bundle: true,
  minify: true,
  format: "iife",
  target: "es2022",
  logLevel: "error",
  outfile: join(folder, "openlayers.js"),
});
writeFileSync(join(folder, "openlayers.html"), page(`<script src="openlayers.js"></script>`));
