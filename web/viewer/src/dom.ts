// Elements of the page. Texts go in as text, never as markup: whatever a file says stays a text.

type Child = Node | string | number | undefined | false;
type Handler = (event: never) => void;
export type Properties = Record<string, string | number | boolean | undefined | Handler>;

function set(element: Element, name: string, value: string | number | boolean | undefined | Handler): void {
  if (value === undefined || value === false) return;
  if (typeof value === "function") element.addEventListener(name.slice(2), value as EventListener);
  else element.setAttribute(name, value === true ? "" : String(value));
}

/** An element with attributes, listeners (`onclick` and the like) and children. */
export function h<K extends keyof HTMLElementTagNameMap>(
  tag: K,
  properties: Properties = {},
  ...children: Child[]
): HTMLElementTagNameMap[K] {
  const element = document.createElement(tag);
  for (const [name, value] of Object.entries(properties)) set(element, name, value);
  element.append(...children.filter((child) => child !== undefined && child !== false).map(asNode));
  return element;
}

const asNode = (child: Child): Node | string => (child instanceof Node ? child : String(child));

/** The same for a drawing. */
export function s(tag: string, properties: Properties = {}, ...children: Node[]): SVGElement {
  const element = document.createElementNS("http://www.w3.org/2000/svg", tag);
  for (const [name, value] of Object.entries(properties)) set(element, name, value);
  element.append(...children);
  return element;
}

/** The element of the page with that id, which is there. */
export function byId<T extends Element = HTMLElement>(id: string): T {
  return document.getElementById(id) as Element as T;
}

/** A list to choose from, with its label. */
export function choice(
  label: string,
  options: readonly (readonly [value: string, text: string])[],
  value: string,
  change: (value: string) => void,
): HTMLLabelElement {
  const list = h("select", { onchange: () => change(list.value) });
  for (const [each, text] of options) list.append(h("option", { value: each, selected: each === value }, text));
  return h("label", { class: "field" }, h("span", {}, label), list);
}

/** An icon out of one path of 24 by 24. */
export function icon(path: string): SVGElement {
  return s("svg", { viewBox: "0 0 24 24", class: "icon", "aria-hidden": "true" }, s("path", { d: path }));
}

/** A number with the digits that a screen has room for. */
export function short(value: number, digits = 6): string {
  if (!Number.isFinite(value)) return String(value);
  if (Number.isInteger(value) && Math.abs(value) < 1e15) return String(value);
  return String(Number(value.toPrecision(digits)));
}
