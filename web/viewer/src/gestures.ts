// Pointers, wheel and keys on the map, told as what they mean.
import type { Point } from "./coordinates.js";

export interface Gestures {
  pan(dx: number, dy: number): void;
  /** By a factor, about a place; `smooth` unless fingers lead it. */
  zoom(factor: number, at: Point | undefined, smooth: boolean): void;
  /** The pointer is there, or has gone. */
  point(at: Point | undefined): void;
  /** Whether a drag draws a line rather than moving the picture. */
  drawing(): boolean;
  drag(from: Point, to: Point, done: boolean): void;
  settled(): void;
  key(event: KeyboardEvent): boolean;
}

const WHEEL = 0.0018; // of the logarithm of the scale, for each pixel of the wheel

/** Places are in pixels of the page from the corner of the element. */
export function listen(element: HTMLElement, to: Gestures): void {
  const pointers = new Map<number, Point>();
  let start: Point | undefined;
  const place = (event: MouseEvent): Point => {
    const { left, top } = element.getBoundingClientRect();
    return { x: event.clientX - left, y: event.clientY - top };
  };
  const isOwn = (event: Event): boolean => !(event.target as Element).closest("button, a, input, .card, [role=slider]");

  element.addEventListener("pointerdown", (event) => {
    if (!isOwn(event) || event.button !== 0) return;
    element.setPointerCapture(event.pointerId);
    pointers.set(event.pointerId, place(event));
    start = pointers.size === 1 ? place(event) : undefined;
    element.classList.add("dragging");
  });
  element.addEventListener("pointermove", (event) => {
    const at = place(event);
    to.point(isOwn(event) ? at : undefined);
    const before = pointers.get(event.pointerId);
    if (!before) return;
    const other = [...pointers].find(([id]) => id !== event.pointerId)?.[1];
    pointers.set(event.pointerId, at);
    if (other) pinch(before, at, other);
    else if (start && to.drawing()) to.drag(start, at, false);
    else to.pan(at.x - before.x, at.y - before.y);
  });
  const pinch = (before: Point, at: Point, other: Point): void => {
    const distance = (a: Point, b: Point): number => Math.max(Math.hypot(a.x - b.x, a.y - b.y), 1);
    to.pan((at.x - before.x) / 2, (at.y - before.y) / 2);
    const middle = { x: (at.x + other.x) / 2, y: (at.y + other.y) / 2 };
    to.zoom(distance(at, other) / distance(before, other), middle, false);
  };
  const end = (event: PointerEvent): void => {
    if (!pointers.delete(event.pointerId)) return;
    if (start && to.drawing() && event.type === "pointerup") to.drag(start, place(event), true);
    start = undefined;
    if (pointers.size === 0) element.classList.remove("dragging");
    to.settled();
  };
  element.addEventListener("pointerup", end);
  element.addEventListener("pointercancel", end);
  element.addEventListener("pointerleave", () => to.point(undefined));
  element.addEventListener("dblclick", (event) => {
    if (isOwn(event)) to.zoom(event.shiftKey ? 0.5 : 2, place(event), true);
  });
  element.addEventListener(
    "wheel",
    (event) => {
      if ((event.target as Element).closest(".card")) return;
      event.preventDefault();
      const lines = [1, 20, 400][event.deltaMode] as number;
      const pixels = Math.min(Math.max(event.deltaY * lines, -400), 400);
      to.zoom(Math.exp(-pixels * WHEEL * (event.ctrlKey ? 5 : 1)), place(event), true);
    },
    { passive: false },
  );
  document.addEventListener("keydown", (event) => {
    const target = event.target as Element;
    const free = target === document.body || target === element;
    if (!free || event.ctrlKey || event.metaKey || event.altKey) return;
    if (to.key(event)) event.preventDefault();
  });
}
