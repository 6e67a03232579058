// The formulas of a style, for the graphics processor. What does not change from pixel to pixel makes programs of its
// own, and the two that are drawn most do next to nothing for a pixel: one band of up to 16 bits is looked up in a table
// of the colours of all its values (lookup.ts), and three are multiplied and added. That matters much where a processor
// without graphics does the work, which takes each number of a vector by itself.
import type { Sampler } from "./samples.js";

/** What a program is made for. */
export interface Variant {
  sampler: Sampler;
  /** Samples are whole and have 16 bits at most. */
  small: boolean;
  /** Textures hold the two parts of one band. */
  complex: boolean;
  /** All bands are in one texture; else each in its own. */
  together: boolean;
  /** The bands are the channels of that texture, in their order. */
  straight: boolean;
  /** Bands that are shown, 1 or 3. */
  count: number;
  alpha: boolean;
  noData: boolean;
  power: boolean;
  /** Some minimum is the maximum. */
  flat: boolean;
  colors: "none" | "map" | "palette";
}

/** Whether all that a style makes of a sample fits into a table of the type's values. */
export const isTabled = ({ small, count, alpha }: Variant): boolean => small && count === 1 && !alpha;

// Whether the screen's own rounding and bounds are all that is needed behind a product and a sum.
const isLinear = ({ small, together, straight, count, alpha, noData, power, flat }: Variant): boolean =>
  small && together && straight && count === 3 && !alpha && !noData && !power && !flat;

export const VERTEX = `#version 300 es
uniform vec4 area; // left, top, right, bottom in pixels of the screen
uniform vec2 screen;
uniform vec4 place; // of the tile: left, top, and samples that a pixel of the screen is wide and high
out highp vec2 at; // in samples of the tile
void main() {
  vec2 corner = mix(area.xy, area.zw, vec2(gl_VertexID & 1, gl_VertexID >> 1));
  at = (corner - place.xy) * place.zw;
  vec2 position = corner / screen * 2.0 - 1.0;
  gl_Position = vec4(position.x, -position.y, 0.0, 1.0);
}`;

interface Words {
  value: string;
  vector: string;
  /** How far values are above the minimum. */
  above: string;
  missing: string;
  /** The entry of a palette. */
  index: string;
}

// Integers are counted from a whole number near the minimum before they become reals, and reals from a minimum of
// twice their precision: a narrow stretch of large values keeps its steps.
const ABOVE_INTEGER = `mix(-vec4(uvec4(base) - uvec4(value)), vec4(uvec4(value) - uvec4(base)),
    greaterThanEqual(value, base)) - rest`;

// Of small ones a difference is never too large, and signed numbers become reals more quickly than others.
const ABOVE_SMALL = "vec4(ivec4(value) - ivec4(base)) - rest";

const WORDS: Record<Sampler, Words> = {
  usampler2D: {
    value: "uint",
    vector: "uvec4",
    above: ABOVE_INTEGER,
    missing: "uvec4(0)",
    index: "value.x < 65536u ? int(value.x) : -1",
  },
  isampler2D: { value: "int", vector: "ivec4", above: ABOVE_INTEGER, missing: "uvec4(0)", index: "value.x" },
  sampler2D: {
    value: "float",
    vector: "vec4",
    above: "(value - base) - rest",
    missing: "uvec4(equal(floatBitsToUint(value) & uvec4(0x7f800000u), uvec4(0x7f800000u)))",
    index: "value.x >= 0.0 && value.x < 65536.0 && value.x == floor(value.x) ? int(value.x) : -1",
  },
};

const CHANNELS = ["x", "y", "z", "w"] as const;

// The samples of the bands that are shown, in the channels of `value`, that of alpha in the last.
function fetch(variant: Variant, vector: string): string {
  const { complex, together, straight, count, alpha } = variant;
  const used = (i: number): boolean => (i === 3 ? alpha : i < count);
  if (together && straight) return `${vector} value = texelFetch(tile0, texel, 0);`;
  const all = together ? `${vector} all = texelFetch(tile0, texel, 0);` : "";
  const parts = CHANNELS.map((channel, i) => {
    if (!used(i)) return `${vector}(0).x`;
    const texel = together ? "all" : `texelFetch(tile${i}, texel, 0)`;
    return complex ? `partOf(${texel}.xy)` : `pick(${texel}, component.${channel})`;
  });
  return `${all}
  ${vector} value = ${vector}(${parts.join(", ")});`;
}

// The built-in angle of two numbers is wrong for very large and very small ones on some processors.
const PARTS = `
float angle(vec2 both) {
  vec2 size = abs(both);
  float most = max(size.x, size.y);
  float part = most == 0.0 ? 0.0 : atan(min(size.x, size.y) / most);
  if (size.y > size.x) part = 1.5707963267948966 - part;
  uvec2 negative = floatBitsToUint(both) >> 31;
  if (negative.x != 0u) part = 3.141592653589793 - part;
  return negative.y != 0u ? -part : part;
}
float partOf(vec2 both) {
  if (any(equal(floatBitsToUint(both) & uvec2(0x7f800000u), uvec2(0x7f800000u)))) return uintBitsToFloat(0x7fc00000u);
  if (omit && both.x == omitted && both.y == 0.0) return uintBitsToFloat(0x7fc00000u);
  if (part == 1) return both.x;
  if (part == 2) return both.y;
  if (part == 3) return angle(both);
  float most = max(abs(both.x), abs(both.y));
  return most == 0.0 ? 0.0 : min(most * length(both / most), 3.4e38);
}`;

const head = (sampler: Sampler): string => `#version 300 es
precision highp float;
precision highp int;
precision highp ${sampler};
in highp vec2 at;
uniform vec2 limit; // within the last sample of the tile
out vec4 color;`;

// The nearest sample; a place before the first is made whole upward.
const TEXEL = "ivec2(min(at, limit))";

/** The sample's colour out of the table of all values of its type, the least of which is `lowest`. */
function tabled({ sampler, straight }: Variant): string {
  return `${head(sampler)}
uniform ${sampler} tile0;
uniform ivec4 component;
uniform int lowest;
uniform sampler2D colors;
void main() {
  ${WORDS[sampler].vector} all = texelFetch(tile0, ${TEXEL}, 0);
  int i = component.x;
  int entry = int(${straight ? "all.x" : "i == 0 ? all.x : i == 1 ? all.y : i == 2 ? all.z : all.w"}) - lowest;
  color = texelFetch(colors, ivec2(entry & 255, entry >> 8), 0);
}`;
}

function linear({ sampler }: Variant): string {
  return `${head(sampler)}
uniform ${sampler} tile0;
uniform ${WORDS[sampler].vector} base;
uniform vec4 rest, inverse;
void main() {
  ivec3 value = ivec3(texelFetch(tile0, ${TEXEL}, 0).xyz);
  color = vec4((vec3(value - ivec3(base.xyz)) - rest.xyz) * inverse.xyz, 1.0);
}`;
}

/** The text of a program for pixels. Colours come out multiplied by alpha. */
export function fragment(variant: Variant): string {
  return isTabled(variant) ? tabled(variant) : isLinear(variant) ? linear(variant) : general(variant);
}

function general(variant: Variant): string {
  const { sampler, small, complex, count, alpha, noData, power, flat, colors } = variant;
  const { value, vector, above, missing, index } = WORDS[sampler];
  const stretched = power ? "pow(t, vec4(power))" : "t";
  const single = {
    none: "vec4(vec3(entry.x / 255.0), 1.0)",
    map: "texelFetch(colors, ivec2(int(entry.x), 0), 0)",
    palette: "inPalette(value)",
  };
  const color =
    count === 1
      ? `missing.x != 0u ? vec4(0.0) : ${single[colors]}`
      : `(missing.x & missing.y & missing.z) != 0u ? vec4(0.0) : vec4(entry.xyz * vec3(1u - missing.xyz) / 255.0, 1.0)`;
  return `${head(sampler)}
uniform ${sampler} tile0, tile1, tile2, tile3;
uniform ivec4 component;
uniform ${vector} base;
uniform vec4 rest, inverse, flatness;
uniform float power; // 1 / gamma
uniform ${vector} noData;
uniform uvec4 hasNoData;
uniform int part;
uniform bool omit;
uniform float omitted;
uniform sampler2D colors;
uniform int entries;

${value} pick(${vector} all, int i) { return i == 0 ? all.x : i == 1 ? all.y : i == 2 ? all.z : all.w; }
${complex ? PARTS : ""}
vec4 inPalette(${vector} value) {
  int entry = ${index};
  return entry < 0 || entry >= entries ? vec4(0.0) : texelFetch(colors, ivec2(entry & 255, entry >> 8), 0);
}
void main() {
  ivec2 texel = ${TEXEL};
  ${fetch(variant, vector)}
  uvec4 missing = ${missing}${noData && !complex ? " | (uvec4(equal(value, noData)) & hasNoData)" : ""};
  vec4 above = ${small ? ABOVE_SMALL : above};
  vec4 t = clamp(above * inverse, 0.0, 1.0);
  ${flat ? "t = mix(t, vec4(greaterThanEqual(above, vec4(0.0))), flatness);" : ""}
  vec4 entry = floor(255.0 * ${stretched} + 0.5);
  color = ${color};
  ${alpha ? "color.a *= missing.w != 0u ? 0.0 : t.w;" : ""}
  ${alpha || colors === "palette" ? "color.rgb *= color.a;" : ""}
}`;
}
