// Where pixels lie: in the raster's own system, and in degrees.
import proj4 from "proj4";

import type { Sidecar } from "./sidecar.js";

export interface Point {
  x: number;
  y: number;
}

/** The place of a raster in a coordinate system. */
export class Georeference {
  readonly name: string;
  readonly geographic: boolean;
  private readonly project: { forward(at: number[]): number[]; inverse(at: number[]): number[] } | undefined;

  constructor(
    readonly transform: readonly number[],
    readonly wkt: string | undefined,
  ) {
    this.name = /^\s*\w+\s*\[\s*"([^"]*)"/.exec(wkt ?? "")?.[1] ?? "no name";
    this.geographic = /^\s*(GEOGCS|GEOGCRS|GEODCRS|GEOGRAPHICCRS)\s*\[/i.test(wkt ?? "");
    try {
      this.project = wkt ? proj4(wkt, "WGS84") : undefined;
    } catch {
      this.project = undefined; // a system that nobody here knows still has its own coordinates
    }
  }

  /** Of a place in pixels of level 0, counted from the corner of the raster. */
  coordinates({ x, y }: Point): Point {
    const [a, b, c, d, e, f] = this.transform as [number, number, number, number, number, number];
    return { x: a + x * b + y * c, y: d + x * e + y * f };
  }

  pixel({ x, y }: Point): Point {
    const [a, b, c, d, e, f] = this.transform as [number, number, number, number, number, number];
    const determinant = b * f - c * e;
    return { x: ((x - a) * f - (y - d) * c) / determinant, y: ((y - d) * b - (x - a) * e) / determinant };
  }

  /** Longitude and latitude in WGS 84; nothing where the system has none, or nobody knows its formulas. */
  degrees(at: Point): Point | undefined {
    const { x, y } = this.coordinates(at);
    if (!this.project) return undefined;
    try {
      const [longitude, latitude] = this.project.forward([x, y]) as [number, number];
      return Number.isFinite(longitude + latitude) ? { x: longitude, y: latitude } : undefined;
    } catch {
      return undefined;
    }
  }

  /** Metres between two places, along the great circle where there are degrees. */
  metres(from: Point, to: Point): number | undefined {
    const [a, b] = [this.degrees(from), this.degrees(to)];
    return a && b && haversine(a, b);
  }
}

const EARTH_RADIUS = 6371008.8; // the mean one, in metres

function haversine(a: Point, b: Point): number {
  const radians = Math.PI / 180;
  const [north, east] = [(b.y - a.y) * radians, (b.x - a.x) * radians];
  const half = Math.sin(north / 2) ** 2 + Math.cos(a.y * radians) * Math.cos(b.y * radians) * Math.sin(east / 2) ** 2;
  return 2 * EARTH_RADIUS * Math.asin(Math.min(Math.sqrt(half), 1));
}

export function georeferenceOf({ transform, wkt }: Sidecar): Georeference | undefined {
  if (!transform) return undefined;
  const [, b, c, , e, f] = transform as [number, number, number, number, number, number];
  return b * f - c * e === 0 ? undefined : new Georeference(transform, wkt);
}

const side = (value: number, positive: string, negative: string, digits: number): string =>
  `${Math.abs(value).toFixed(digits)}° ${value < 0 ? negative : positive}`;

/** Latitude and longitude, with digits enough to tell two pixels apart. */
export function formatDegrees({ x, y }: Point, digits: number): string {
  return `${side(y, "N", "S", digits)}, ${side(x, "E", "W", digits)}`;
}

/** Decimals that tell apart what lies `resolution` from each other. */
export const decimals = (resolution: number): number =>
  Math.min(Math.max(Math.ceil(1 - Math.log10(Math.abs(resolution) || 1)), 0), 9);

/** A round length of at most `most`: 1, 2 or 5 times a power of ten. */
export function roundLength(most: number): number {
  const power = 10 ** Math.floor(Math.log10(most));
  return ([5, 2].find((factor) => factor * power <= most) ?? 1) * power;
}

export function formatMetres(metres: number): string {
  if (metres >= 1000) return `${Number((metres / 1000).toPrecision(4))} km`;
  return metres >= 1 ? `${Number(metres.toPrecision(4))} m` : `${Number((metres * 100).toPrecision(3))} cm`;
}
