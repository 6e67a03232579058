// The colours that a style makes of all values of a type of up to 16 bits, as a texture: what a stretch, gamma, a colour
// map or palette and a value without data come to is then one look for each pixel.
import type { PixelType } from "../../src/types.js";
import { type Range, rangeOfType, step, type Style } from "./style.js";

export class Lookup {
  private readonly texture: WebGLTexture;
  private readonly pixels: Uint8Array;
  private key = "";
  private of: Uint8Array | undefined;

  constructor(
    private readonly gl: WebGL2RenderingContext,
    private readonly type: PixelType,
  ) {
    const { minimum, maximum } = rangeOfType(type);
    this.pixels = new Uint8Array(4 * (maximum - minimum + 1));
    this.texture = gl.createTexture();
    this.bindTexture();
    gl.texStorage2D(gl.TEXTURE_2D, 1, gl.RGBA8, 256, this.rows);
    for (const filter of [gl.TEXTURE_MIN_FILTER, gl.TEXTURE_MAG_FILTER])
      gl.texParameteri(gl.TEXTURE_2D, filter, gl.NEAREST);
  }

  private get rows(): number {
    return this.pixels.length / 1024;
  }

  private bindTexture(): void {
    this.gl.bindTexture(this.gl.TEXTURE_2D, this.texture);
  }

  /** Binds the table of a style to the unit that is active; made anew only where it is another. */
  bind(range: Range, noData: number | undefined, colors: Uint8Array | undefined, { gamma, colors: name }: Style): void {
    const { gl } = this;
    this.bindTexture();
    const key = [range.minimum, range.maximum, noData, gamma, name].join(" ");
    if (key === this.key && colors === this.of) return;
    [this.key, this.of] = [key, colors];
    this.fill(range, noData, colors, gamma, name === "palette");
    gl.pixelStorei(gl.UNPACK_ALIGNMENT, 1);
    gl.texSubImage2D(gl.TEXTURE_2D, 0, 0, 0, 256, this.rows, gl.RGBA, gl.UNSIGNED_BYTE, this.pixels);
  }

  private fill(
    range: Range,
    noData: number | undefined,
    colors: Uint8Array | undefined,
    gamma: number,
    palette: boolean,
  ): void {
    const words = new Uint32Array(this.pixels.buffer);
    const shown = palette ? premultiplied(colors ?? new Uint8Array()) : stepsOf(colors);
    const lowest = rangeOfType(this.type).minimum;
    for (let i = 0; i < words.length; ++i) {
      const value = lowest + i;
      words[i] = value === noData ? 0 : (shown[palette ? value : step(value, range, gamma)] ?? 0);
    }
  }
}

const wordsOf = (bytes: Uint8Array): Uint32Array =>
  new Uint32Array(Uint8Array.from(bytes).buffer, 0, bytes.length >> 2);

// The 256 colours from the least to the greatest step.
function stepsOf(colors: Uint8Array | undefined): Uint32Array {
  return wordsOf(colors ?? Uint8Array.from({ length: 1024 }, (_, i) => (i % 4 === 3 ? 255 : i >> 2)));
}

function premultiplied(colors: Uint8Array): Uint32Array {
  return wordsOf(
    colors.map((value, i) => (i % 4 === 3 ? value : Math.round((value * (colors[i | 3] as number)) / 255))),
  );
}
