// What the server's own renderer is asked for, so that its picture is what the viewer will draw.
import type { Size } from "./camera.js";
import type { State } from "./link.js";
import type { Style } from "./style.js";

/** The keys of a style as the server knows them; nothing where it has no words for what a link tells. */
function styleKeys({ bands, alpha, ranges, gamma, colors, noData, part }: Partial<Style>): string[][] | undefined {
  const out: string[][] = [];
  const told = bands?.map((band) => ranges?.[band]);
  const stretched = told?.every((range) => range !== undefined);
  if (told?.some((range) => range !== undefined) && !stretched) return undefined;
  // Of its phase the viewer has a usual stretch of its own.
  if (part !== undefined && !stretched) return undefined;
  if (bands) out.push(["bands", [...bands, ...(alpha === undefined ? [] : [alpha])].map((band) => band + 1).join(",")]);
  if (told && stretched)
    out.push(["stretch", told.map((range) => `${range?.minimum},${range?.maximum}`.replaceAll("e+", "e")).join(";")]);
  // Without bands in a link its colours do not count, and with them grey is meant where there is no other word.
  if (bands?.length === 1 && colors !== undefined) out.push(["colormap", colors]);
  if (gamma !== undefined) out.push(["gamma", String(gamma)]);
  if (noData !== undefined && noData !== "file") out.push(["nodata", noData]);
  if (part !== undefined) out.push(["complex", part]);
  return out;
}

/**
 * The address of the picture that a screen shows of one file of the page's own server; nothing for two sides and for
 * files from elsewhere.
 * @param page The address of the page.
 * @param zoomed By which the link's zoom, in pixels of the page, is larger in those of the screen.
 */
export function viewAddress({ sides, view }: State, screen: Size, page: string, zoomed: number): string | undefined {
  const [side] = sides;
  if (sides.length !== 1 || side?.file === undefined || !URL.canParse(side.file, page)) return undefined;
  const [file, folder] = [new URL(side.file, page), new URL("files/", page)];
  if (file.origin !== folder.origin || !file.pathname.startsWith(folder.pathname) || file.search) return undefined;
  const keys = styleKeys(side.style ?? {});
  if (!keys) return undefined;
  const address = new URL(`view/${file.pathname.slice(folder.pathname.length)}`, page);
  address.search = new URLSearchParams([
    ["screen", `${screen.width},${screen.height}`],
    ...(view
      ? [
          ["at", `${view.x},${view.y}`],
          ["zoom", String(view.zoom * zoomed)],
        ]
      : []),
    ...keys,
  ]).toString();
  return address.href;
}
