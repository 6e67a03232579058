// What stands in a sidecar: georeference, values without data, descriptions. The texts are those of a file: they
// are parsed as XML that the page never takes into its document.
export interface SidecarBand {
  noData?: string;
  description?: string;
  unit?: string;
  interpretation?: string;
}

export interface Sidecar {
  /** The six numbers from columns and rows to coordinates. */
  transform?: number[];
  wkt?: string;
  bands: SidecarBand[];
}

interface Policies {
  createPolicy(name: string, rules: { createHTML(text: string): string }): { createHTML(text: string): string };
}

// The one place that hands a text to a parser; the page's policy allows no other.
const policies = (globalThis as { trustedTypes?: Policies }).trustedTypes;
const policy = policies?.createPolicy("sidecar", { createHTML: (text) => text });

function textOf(parent: Element, tag: string): string | undefined {
  const child = [...parent.children].find((each) => each.tagName === tag);
  return child?.textContent?.trim() || undefined;
}

// The eight bytes of a real stand beside its text.
function exact(element: Element): string | undefined {
  const hex = element.getAttribute("le_hex_equiv");
  const text = element.textContent?.trim();
  if (!hex || !/^[\da-f]{16}$/i.test(hex)) return text || undefined;
  const bytes = new DataView(new ArrayBuffer(8));
  for (let i = 0; i < 8; ++i) bytes.setUint8(i, parseInt(hex.slice(2 * i, 2 * i + 2), 16));
  return String(bytes.getFloat64(0, true));
}

function bandOf(element: Element): SidecarBand {
  const noData = [...element.children].find(({ tagName }) => tagName === "NoDataValue");
  const found = {
    noData: noData && exact(noData),
    description: textOf(element, "Description"),
    unit: textOf(element, "UnitType"),
    interpretation: textOf(element, "ColorInterp"),
  };
  return Object.fromEntries(Object.entries(found).filter(([, value]) => value !== undefined)) as SidecarBand;
}

/** Reads a sidecar; what is none, or is malformed, tells nothing. */
export function parseSidecar(text: string): Sidecar {
  const none: Sidecar = { bands: [] };
  if (/<!DOCTYPE/i.test(text)) return none;
  const trusted = policy ? policy.createHTML(text) : text;
  const root = new DOMParser().parseFromString(trusted as string, "application/xml").documentElement;
  if (root.tagName !== "PAMDataset") return none;
  const transform = textOf(root, "GeoTransform")?.split(",").map(Number);
  const wkt = textOf(root, "SRS");
  const bands: SidecarBand[] = [];
  for (const element of root.getElementsByTagName("PAMRasterBand"))
    bands[Number(element.getAttribute("band")) - 1] = bandOf(element);
  const usable = transform?.length === 6 && transform.every(Number.isFinite);
  return { bands, ...(usable && { transform }), ...(wkt && { wkt }) };
}
