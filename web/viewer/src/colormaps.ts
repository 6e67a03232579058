// The colour maps, out of the one list that the program's own renderer reads too.
import text from "colormaps.txt";

/** Red, green, blue and alpha of 256 colours, by the name of the map. */
export const COLOR_MAPS: ReadonlyMap<string, Uint8Array> = new Map(
  text
    .split("\n")
    .filter((line) => line && !line.startsWith("#"))
    .map((line) => {
      const [name, hex] = line.split(" ") as [string, string];
      const colors = new Uint8Array(1024).fill(255);
      for (let i = 0; i < 256; ++i)
        for (let part = 0; part < 3; ++part)
          colors[4 * i + part] = parseInt(hex.slice(6 * i + 2 * part, 6 * i + 2 * part + 2), 16);
      return [name, colors];
    }),
);
