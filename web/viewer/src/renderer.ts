// Draws layers of tiles with WebGL 2. Samples lie in the textures as they are; how they look is decided here, each time.
import {
  aligned,
  type Alignment,
  countOf,
  levelFor,
  type Placement,
  type Size,
  type TileRange,
  visibleTiles,
} from "./camera.js";
import { COLOR_MAPS } from "./colormaps.js";
import type { Level } from "../../src/layout.js";
import type { Raster } from "./raster.js";
import { type Sampler } from "./samples.js";
import { Lookup } from "./lookup.js";
import { fragment, isTabled, type Variant, VERTEX } from "./shaders.js";
import { isComplex, PARTS, type Range, rangeOfType, type Style } from "./style.js";
import { type Channel, type Tile, type TileAddress, TileStore } from "./tiles.js";

/** A raster in a style, on the part of the screen between two columns of its pixels. */
export interface Layer {
  raster: Raster;
  store: TileStore;
  style: Style;
  alignment: Alignment;
  from: number;
  to: number;
}

interface Program {
  program: WebGLProgram;
  checked: boolean; // that it was made well
  locations: Map<string, WebGLUniformLocation | null>;
}

interface Area {
  left: number;
  top: number;
  right: number;
  bottom: number;
}

const UNIT_COLORS = 4;

export class Renderer {
  private context: WebGL2RenderingContext | undefined;
  private programs = new Map<string, Program>();
  private tables = new Map<object, WebGLTexture>();
  private lookups = new WeakMap<TileStore, Lookup>();
  private screen: Size = { width: 1, height: 1 };
  private grain = 1;

  constructor(readonly canvas: HTMLCanvasElement) {}

  /**
   * Starts the graphics processor, which takes long where there is none. Nothing can be drawn before.
   * @throws Error where the browser has no WebGL 2
   */
  begin(): WebGL2RenderingContext {
    const gl = this.context ?? this.canvas.getContext("webgl2", { antialias: false, depth: false, stencil: false });
    if (!gl) throw new Error("This browser has no WebGL 2, or it is switched off.");
    this.context = gl;
    return gl;
  }

  get begun(): boolean {
    return this.context !== undefined;
  }

  get gl(): WebGL2RenderingContext {
    return this.begin();
  }

  /** After the graphics processor was lost: nothing that it had is there. */
  reset(): void {
    this.programs = new Map();
    this.tables = new Map();
    this.lookups = new WeakMap();
  }

  resize({ width, height }: Size): void {
    this.screen = { width: Math.max(width, 1), height: Math.max(height, 1) };
    this.fit();
  }

  // The picture has as many pixels as are drawn; the page enlarges it to the screen.
  private fit(): void {
    const { canvas, screen, grain } = this;
    const [width, height] = [Math.ceil(screen.width / grain), Math.ceil(screen.height / grain)];
    if (canvas.width !== width) canvas.width = width;
    if (canvas.height !== height) canvas.height = height;
  }

  get size(): Size {
    return this.screen;
  }

  /**
   * Draws all layers, and with `ask` asks for what they lack. No pixel is drawn twice, so nothing is blended here:
   * what is transparent shows the page below. With a `grain` of 2 each sample that is drawn fills two by two pixels.
   */
  draw(layers: readonly Layer[], placement: Placement, ask: boolean, grain: 1 | 2 = 1): void {
    const { gl, screen } = this;
    const of = (pixels: number): number => Math.ceil(pixels / grain);
    this.grain = grain;
    this.fit();
    gl.viewport(0, 0, of(screen.width), of(screen.height));
    gl.disable(gl.SCISSOR_TEST);
    gl.clearColor(0, 0, 0, 0);
    gl.clear(gl.COLOR_BUFFER_BIT);
    gl.enable(gl.SCISSOR_TEST);
    for (const layer of layers) {
      gl.scissor(of(layer.from), 0, Math.max(of(layer.to) - of(layer.from), 0), of(screen.height));
      this.drawLayer(layer, aligned(placement, layer.alignment), ask);
    }
  }

  /** Tells the milliseconds from `start` until all that was asked of the graphics processor is done. Waits for nothing. */
  async done(start: number): Promise<number> {
    const { gl } = this;
    const sync = gl.fenceSync(gl.SYNC_GPU_COMMANDS_COMPLETE, 0);
    gl.flush();
    while (sync && !gl.isContextLost() && gl.getSyncParameter(sync, gl.SYNC_STATUS) !== gl.SIGNALED)
      await new Promise((resolve) => setTimeout(resolve, 1));
    if (sync) gl.deleteSync(sync);
    return performance.now() - start;
  }

  /** Has the programs made that a change of gamma or colours would need, before it comes. Draws nothing. */
  warm(layers: readonly Layer[], placement: Placement): void {
    this.gl.scissor(0, 0, 0, 0);
    for (const layer of layers) {
      const place = aligned(placement, layer.alignment);
      const { style } = layer;
      const mapped = style.bands.length === 1 ? ["grey", "viridis"] : [style.colors];
      for (const colors of mapped)
        for (const gamma of [1, 2]) this.drawLayer({ ...layer, style: { ...style, colors, gamma } }, place, false);
    }
  }

  /** Waits until all that was asked of the graphics processor is done. */
  finish(): void {
    this.gl.readPixels(0, 0, 1, 1, this.gl.RGBA, this.gl.UNSIGNED_BYTE, new Uint8Array(4));
  }

  /** What was just drawn, row by row from the top: red, green, blue, alpha; colours are multiplied by alpha. */
  pixels(): Uint8Array {
    const { width, height } = this.canvas;
    const upward = new Uint8Array(4 * width * height);
    this.gl.readPixels(0, 0, width, height, this.gl.RGBA, this.gl.UNSIGNED_BYTE, upward);
    const out = new Uint8Array(upward.length);
    for (let row = 0; row < height; ++row)
      out.set(upward.subarray(4 * width * (height - 1 - row), 4 * width * (height - row)), 4 * width * row);
    return out;
  }

  private drawLayer(layer: Layer, placement: Placement, ask: boolean): void {
    const { raster, store, style, from, to } = layer;
    store.suit(style);
    const bands = style.alpha === undefined ? style.bands : [...style.bands, style.alpha];
    const groups = [...new Set(bands.map((band) => store.channelOf(band).group))];
    const { level, range } = this.levelOf(raster, store, placement, groups, from, to);
    const tiles = tilesOf(level, range);
    const last = raster.pyramid.levels.filter(({ width, height }) => width > 0 && height > 0).at(-1) as Level;
    const backdrop = countOf({ left: 0, top: 0, right: last.tilesAcross - 1, bottom: last.tilesDown - 1 }) <= 4;
    const coarsest = backdrop && last.level !== level.level ? tilesOf(last, wholeOf(last)) : [];
    if (ask) store.want([...coarsest, ...tiles], groups);
    // Its program is being made while the first tiles come.
    const look = this.lookOf(layer, groups);
    this.program(look.variant);
    let prepared: Prepared | undefined;
    const painter = new Painter(raster, store, groups, placement, (tile, area, at) =>
      this.drawTile((prepared ??= this.prepare(look)), tile, area, at),
    );
    for (const tile of tiles) painter.paint(tile);
  }

  // The level that suits the zoom, or the next whose tiles fit into memory.
  private levelOf(
    raster: Raster,
    store: TileStore,
    placement: Placement,
    groups: number[],
    from: number,
    to: number,
  ): { level: Level; range: TileRange } {
    const { levels, header } = raster.pyramid;
    let level = levelFor(levels, placement);
    for (;;) {
      // Of a half of the screen, only what it shows.
      const shifted = { ...placement, left: placement.left - from };
      const range = visibleTiles(level, header.tileSize, shifted, { width: to - from, height: this.screen.height });
      const next = levels[level.level + 1 - header.levelMin];
      if (store.fits(countOf(range) + 4, groups) || !next || !next.width || !next.height) return { level, range };
      level = next;
    }
  }

  private drawTile({ program, channels, groups }: Prepared, tiles: Tile[], area: Area, at: Placement): void {
    const { gl } = this;
    const first = tiles[0] as Tile;
    gl.uniform4f(this.at(program, "place"), at.left, at.top, 1 / at.scaleX, 1 / at.scaleY);
    gl.uniform2f(this.at(program, "limit"), first.width - 0.5, first.height - 0.5);
    channels.forEach(({ group }, i) => {
      gl.activeTexture(gl.TEXTURE0 + i);
      gl.bindTexture(gl.TEXTURE_2D, (tiles[groups.indexOf(group)] as Tile).texture);
    });
    this.quad(program, area);
  }

  // All of a style that does not depend on the tile.
  private lookOf({ raster, store, style }: Layer, groups: number[]): Look {
    const first = style.bands[0] as number;
    const bands = [first, style.bands[1] ?? first, style.bands[2] ?? first, style.alpha ?? first];
    const shown = style.alpha === undefined ? style.bands : [...style.bands, style.alpha];
    const channels = bands.map((band) => store.channelOf(band));
    const bounds = bands.map((band, i) => boundsOf(raster, store, style, band, i === 3 && style.alpha !== undefined));
    const noData = bands.map((band) => comparable(store, raster.noData(band, style.noData)));
    const colors = this.colorsOf(raster, style);
    const whole: Variant = {
      sampler: store.format.sampler,
      small: store.format.bytes <= 2 && store.format.sampler !== "sampler2D",
      complex: isComplex(raster.type),
      together: groups.length === 1,
      straight:
        !isComplex(raster.type) &&
        shown.every((band) => channels[bands.indexOf(band)]?.component === bands.indexOf(band)),
      count: style.bands.length,
      alpha: style.alpha !== undefined,
      noData: noData.some((value) => value !== undefined),
      power: style.gamma !== 1,
      flat: bounds.some(({ minimum, maximum }) => minimum === maximum),
      colors: !colors ? "none" : style.colors === "palette" ? "palette" : "map",
    };
    // What stands in a table is the same program.
    const variant: Variant = isTabled(whole)
      ? { ...whole, together: true, noData: false, power: false, flat: false, colors: "none" }
      : whole;
    return { raster, store, variant, channels, groups, bounds, noData, colors, style };
  }

  private prepareLookup({ variant, raster, store, channels, groups, ...look }: Look): Prepared {
    const { gl } = this;
    const program = this.use(variant);
    const lookup = this.lookups.get(store) ?? new Lookup(gl, raster.type);
    this.lookups.set(store, lookup);
    gl.uniform1i(this.at(program, "tile0"), 0);
    gl.uniform4i(this.at(program, "component"), channels[0]?.component ?? 0, 0, 0, 0);
    gl.uniform1i(this.at(program, "lowest"), rangeOfType(raster.type).minimum);
    gl.uniform1i(this.at(program, "colors"), UNIT_COLORS);
    gl.activeTexture(gl.TEXTURE0 + UNIT_COLORS);
    lookup.bind(look.bounds[0] as Range, look.noData[0], look.colors, look.style);
    return { program, channels: channels.slice(0, 1), groups };
  }

  private prepare(look: Look): Prepared {
    if (isTabled(look.variant)) return this.prepareLookup(look);
    const { variant, channels, groups, bounds, noData, colors, style } = look;
    const { gl } = this;
    const program = this.use(variant);
    channels.forEach((_, i) => gl.uniform1i(this.at(program, `tile${i}`), i));
    gl.uniform4iv(
      this.at(program, "component"),
      channels.map(({ component }) => component),
    );
    gl.uniform1f(this.at(program, "power"), 1 / style.gamma);
    this.setBounds(program, variant, bounds);
    this.setNoData(program, variant, noData);
    gl.uniform1i(this.at(program, "part"), PARTS.indexOf(style.part));
    if (colors) this.setColors(program, colors);
    return { program, channels, groups };
  }

  private setBounds(program: Program, { sampler, small }: Variant, bounds: readonly Range[]): void {
    const { gl } = this;
    const bases = bounds.map(({ minimum }) => baseOf(sampler, small, minimum));
    this.setVector(program, sampler, "base", bases);
    const set = (name: string, value: (range: Range, i: number) => number): void =>
      gl.uniform4fv(this.at(program, name), bounds.map(value));
    set("rest", ({ minimum }, i) => minimum - (bases[i] as number));
    set("inverse", ({ minimum, maximum }) => (maximum === minimum ? 0 : 1 / (maximum - minimum)));
    set("flatness", ({ minimum, maximum }) => Number(maximum === minimum));
  }

  private setNoData(program: Program, { sampler, complex }: Variant, values: readonly (number | undefined)[]): void {
    const { gl } = this;
    if (complex) {
      gl.uniform1i(this.at(program, "omit"), Number(values[0] !== undefined));
      gl.uniform1f(this.at(program, "omitted"), values[0] ?? 0);
      return;
    }
    const numbers = values.map((value) => value ?? 0);
    this.setVector(program, sampler, "noData", numbers);
    gl.uniform4uiv(
      this.at(program, "hasNoData"),
      values.map((value) => Number(value !== undefined)),
    );
  }

  private setVector(program: Program, sampler: Sampler, name: string, values: number[]): void {
    const at = this.at(program, name);
    if (sampler === "usampler2D") this.gl.uniform4uiv(at, values);
    else if (sampler === "isampler2D") this.gl.uniform4iv(at, values);
    else this.gl.uniform4fv(at, values);
  }

  // The colours of one band: those of a map, or the palette of the file.
  private colorsOf(raster: Raster, { bands, colors }: Style): Uint8Array | undefined {
    if (bands.length !== 1 || colors === "grey") return undefined;
    if (colors === "palette") return raster.palette(bands[0] as number);
    const reversed = colors.startsWith("-");
    const map = COLOR_MAPS.get(colors.slice(Number(reversed)));
    return reversed && map ? reverse(map) : map;
  }

  private setColors(program: Program, colors: Uint8Array): void {
    const { gl } = this;
    gl.uniform1i(this.at(program, "colors"), UNIT_COLORS);
    gl.uniform1i(this.at(program, "entries"), Math.min(colors.length / 4, 65536));
    gl.activeTexture(gl.TEXTURE0 + UNIT_COLORS);
    gl.bindTexture(gl.TEXTURE_2D, this.table(colors));
  }

  private table(colors: Uint8Array): WebGLTexture {
    const { gl } = this;
    const known = this.tables.get(colors);
    if (known) return known;
    const rows = Math.min(Math.ceil(colors.length / 1024), 256);
    const padded = new Uint8Array(rows * 1024);
    padded.set(colors.subarray(0, padded.length));
    const texture = gl.createTexture();
    gl.bindTexture(gl.TEXTURE_2D, texture);
    gl.texImage2D(gl.TEXTURE_2D, 0, gl.RGBA8, 256, rows, 0, gl.RGBA, gl.UNSIGNED_BYTE, padded);
    for (const filter of [gl.TEXTURE_MIN_FILTER, gl.TEXTURE_MAG_FILTER])
      gl.texParameteri(gl.TEXTURE_2D, filter, gl.NEAREST);
    this.tables.set(colors, texture);
    return texture;
  }

  private program(variant: Variant): Program {
    const name = Object.values(variant).join(" ");
    const program = this.programs.get(name) ?? this.compile(fragment(variant));
    this.programs.set(name, program);
    return program;
  }

  private use(variant: Variant): Program {
    const program = this.program(variant);
    if (!program.checked) this.check(program);
    this.gl.useProgram(program.program);
    return program;
  }

  // Asking waits until the program is made, so it is asked as late as can be.
  private check(program: Program): void {
    const { gl } = this;
    if (!gl.getProgramParameter(program.program, gl.LINK_STATUS) && !gl.isContextLost()) {
      const logs = (gl.getAttachedShaders(program.program) ?? []).map((shader) => gl.getShaderInfoLog(shader));
      throw new Error(`The graphics processor refuses a program: ${logs.filter(Boolean).join(" ")}`);
    }
    program.checked = true;
  }

  private compile(source: string): Program {
    const { gl } = this;
    const program = gl.createProgram();
    for (const [type, text] of [
      [gl.VERTEX_SHADER, VERTEX],
      [gl.FRAGMENT_SHADER, source],
    ] as const) {
      const shader = gl.createShader(type) as WebGLShader;
      gl.shaderSource(shader, text);
      gl.compileShader(shader);
      gl.attachShader(program, shader);
    }
    gl.linkProgram(program);
    return { program, locations: new Map(), checked: false };
  }

  private at({ program, locations }: Program, name: string): WebGLUniformLocation | null {
    const known = locations.get(name);
    if (known !== undefined) return known;
    const location = this.gl.getUniformLocation(program, name);
    locations.set(name, location);
    return location;
  }

  private quad(program: Program, { left, top, right, bottom }: Area): void {
    const { grain } = this;
    // Where samples fill several pixels, the last of them may reach beyond the screen.
    const [width, height] = [this.screen.width, this.screen.height].map((each) => Math.ceil(each / grain) * grain);
    this.gl.uniform2f(this.at(program, "screen"), width as number, height as number);
    this.gl.uniform4f(this.at(program, "area"), left, top, right, bottom);
    this.gl.drawArrays(this.gl.TRIANGLE_STRIP, 0, 4);
  }
}

/** What a style comes to for a raster. */
interface Look {
  raster: Raster;
  store: TileStore;
  variant: Variant;
  channels: readonly Channel[];
  groups: readonly number[];
  bounds: readonly Range[];
  noData: readonly (number | undefined)[];
  colors: Uint8Array | undefined;
  style: Style;
}

/** A style that is ready to be drawn with. */
interface Prepared {
  program: Program;
  channels: readonly Channel[];
  groups: readonly number[];
}

// The stretch of a band as its textures have the samples. A band of alpha is opaque at the end of its type, and at 1 in
// reals. The phase does not depend on what complex samples are divided by.
function boundsOf(raster: Raster, store: TileStore, style: Style, band: number, alpha: boolean): Range {
  const { base, unit } = store.conversion(band);
  const { minimum, maximum } = alpha
    ? { minimum: 0, maximum: rangeOfType(raster.type).maximum }
    : (style.ranges[band] ?? rangeOfType(raster.type));
  const by = isComplex(raster.type) && style.part === "phase" ? 1 : unit;
  return { minimum: (minimum - base) / by, maximum: (maximum - base) / by };
}

// The value that samples are counted from: the minimum, as near as their type has it. A minimum that is far from all
// small samples may be farther from it.
function baseOf(sampler: Sampler, small: boolean, minimum: number): number {
  if (sampler === "sampler2D") return Math.fround(minimum);
  const [least, most] = TYPE_ENDS[sampler];
  const end = small ? 2 ** 20 : 2 ** 32;
  return Math.min(Math.max(Math.floor(minimum), least, -end), most, end);
}

const TYPE_ENDS = { usampler2D: [0, 2 ** 32 - 1], isampler2D: [-(2 ** 31), 2 ** 31 - 1] } as const;

// What samples in a texture are compared with; nothing where none of them can have it, or where it is none already.
function comparable({ format }: TileStore, value: number | bigint | undefined): number | undefined {
  if (typeof value !== "number" || format.converted || Number.isNaN(value)) return undefined;
  if (format.sampler === "sampler2D") return value;
  const [least, most] = TYPE_ENDS[format.sampler];
  return Number.isInteger(value) && value >= least && value <= most ? value : undefined;
}

const reversals = new WeakMap<Uint8Array, Uint8Array>();

function reverse(colors: Uint8Array): Uint8Array {
  const known = reversals.get(colors);
  if (known) return known;
  const out = new Uint8Array(colors.length);
  for (let i = 0; i < colors.length; i += 4) out.set(colors.subarray(i, i + 4), colors.length - 4 - i);
  reversals.set(colors, out);
  return out;
}

const wholeOf = ({ tilesAcross, tilesDown }: Level): TileRange => ({
  left: 0,
  top: 0,
  right: tilesAcross - 1,
  bottom: tilesDown - 1,
});

// From the middle outward.
function tilesOf({ level }: Level, { left, top, right, bottom }: TileRange): TileAddress[] {
  const tiles: TileAddress[] = [];
  for (let y = top; y <= bottom; ++y) for (let x = left; x <= right; ++x) tiles.push({ level, x, y });
  const [middleX, middleY] = [(left + right) / 2, (top + bottom) / 2];
  const far = ({ x, y }: TileAddress): number => (x - middleX) ** 2 + (y - middleY) ** 2;
  return tiles.sort((a, b) => far(a) - far(b));
}

type Draw = (tiles: Tile[], area: Area, at: Placement) => void;

/** Finds for each tile what is best there: itself, the finer ones that it consists of, or a part of a coarser one. */
class Painter {
  constructor(
    private readonly raster: Raster,
    private readonly store: TileStore,
    private readonly groups: readonly number[],
    private readonly placement: Placement,
    private readonly draw: Draw,
  ) {}

  paint(tile: TileAddress): void {
    const own = this.find(tile);
    if (own) return this.show(tile, own, this.areaOf(tile));
    const finer = this.finer(tile);
    if (finer) return finer.forEach(([each, found]) => this.show(each, found, this.areaOf(each)));
    for (let up = 1; tile.level + up <= this.raster.pyramid.header.levelMax; ++up) {
      const above = { level: tile.level + up, x: tile.x >> up, y: tile.y >> up };
      const found = this.find(above);
      if (found) return this.show(above, found, this.clip(this.areaOf(tile), this.areaOf(above)));
    }
  }

  private find(tile: TileAddress): Tile[] | undefined {
    const found = this.groups.map((group) => this.store.get(tile, group));
    return found.every((each) => each !== undefined) ? found : undefined;
  }

  private finer({ level, x, y }: TileAddress): [TileAddress, Tile[]][] | undefined {
    const below = this.raster.pyramid.levels[level - 1 - this.raster.pyramid.header.levelMin];
    if (!below) return undefined;
    const out: [TileAddress, Tile[]][] = [];
    for (const [dx, dy] of [
      [0, 0],
      [1, 0],
      [0, 1],
      [1, 1],
    ] as const) {
      const tile = { level: below.level, x: 2 * x + dx, y: 2 * y + dy };
      if (tile.x >= below.tilesAcross || tile.y >= below.tilesDown) continue;
      const found = this.find(tile);
      if (!found) return undefined;
      out.push([tile, found]);
    }
    return out;
  }

  private show(tile: TileAddress, found: Tile[], area: Area): void {
    const scale = 2 ** tile.level;
    const [scaleX, scaleY] = [this.placement.scaleX * scale, this.placement.scaleY * scale];
    const { left, top } = this.cornerOf(tile);
    this.draw(found, area, { left, top, scaleX, scaleY });
  }

  private cornerOf({ level, x, y }: TileAddress): { left: number; top: number } {
    const side = this.raster.pyramid.header.tileSize * 2 ** level;
    const { left, top, scaleX, scaleY } = this.placement;
    return { left: left + x * side * scaleX, top: top + y * side * scaleY };
  }

  // Neighbours have the same edge, computed the same way, and so no gap between them.
  private areaOf({ level, x, y }: TileAddress): Area {
    const of = this.raster.pyramid.level(level);
    const { tileSize } = this.raster.pyramid.header;
    const { left, top } = this.cornerOf({ level, x, y });
    const next = this.cornerOf({ level, x: x + 1, y: y + 1 });
    const columns = Math.min(tileSize, of.width - x * tileSize);
    const rows = Math.min(tileSize, of.height - y * tileSize);
    const scale = 2 ** level;
    const right = columns === tileSize ? next.left : left + columns * scale * this.placement.scaleX;
    const bottom = rows === tileSize ? next.top : top + rows * scale * this.placement.scaleY;
    return { left, top, right, bottom };
  }

  private clip(a: Area, b: Area): Area {
    return {
      left: Math.max(a.left, b.left),
      top: Math.max(a.top, b.top),
      right: Math.max(Math.min(a.right, b.right), Math.max(a.left, b.left)),
      bottom: Math.max(Math.min(a.bottom, b.bottom), Math.max(a.top, b.top)),
    };
  }
}
