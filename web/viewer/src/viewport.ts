// Where the view is, and how it moves. Places are in pixels of the page, the view's own zoom in pixels of the screen.
import { fitting, inside, MOST_ZOOM, type Placement, placementOf, type Size, type View, zoomed } from "./camera.js";
import type { Point } from "./coordinates.js";

export class Viewport {
  view: View | undefined;
  private target: { zoom: number; at: Point } | undefined; // of a zoom on its way

  /**
   * @param raster The size of the raster that the view is of, if there is one.
   * @param screen The size of the picture, in pixels of the screen.
   * @param moved Is called when the view is another.
   */
  constructor(
    private readonly raster: () => Size | undefined,
    private readonly screen: () => Size,
    private readonly moved: () => void,
  ) {}

  /** Whether a zoom is on its way. */
  get moving(): boolean {
    return this.target !== undefined;
  }

  get placement(): Placement | undefined {
    return this.view && placementOf(this.view, this.screen());
  }

  /** The same in pixels of the page. */
  get onPage(): Placement | undefined {
    const { placement } = this;
    const by = devicePixelRatio;
    if (!placement) return undefined;
    const { left, top, scaleX, scaleY } = placement;
    return { left: left / by, top: top / by, scaleX: scaleX / by, scaleY: scaleY / by };
  }

  get middle(): Point {
    const { width, height } = this.screen();
    return { x: width / devicePixelRatio / 2, y: height / devicePixelRatio / 2 };
  }

  /** Another view, at once. */
  set(view: View | undefined): void {
    this.view = view;
    this.target = undefined;
  }

  /** Whether the whole raster is shown, as on a screen of that size. */
  isFitting(screen: Size): boolean {
    const raster = this.raster();
    return raster !== undefined && JSON.stringify(fitting(raster, screen)) === JSON.stringify(this.view);
  }

  fit(): void {
    const raster = this.raster();
    if (!raster) return;
    this.set(fitting(raster, this.screen()));
    this.moved();
  }

  pan(dx: number, dy: number): void {
    const raster = this.raster();
    if (!raster || !this.view) return;
    const by = devicePixelRatio / this.view.zoom;
    this.view = inside({ ...this.view, x: this.view.x - dx * by, y: this.view.y - dy * by }, raster);
    this.moved();
  }

  /** By a factor, about a place or the middle; in some pictures if it is to be `smooth`. */
  zoom(factor: number, at: Point | undefined, smooth: boolean): void {
    if (!this.view || !this.raster()) return;
    const by = devicePixelRatio;
    const { x, y } = at ?? this.middle;
    const aim = (this.target?.zoom ?? this.view.zoom) * factor;
    this.target = { zoom: Math.min(Math.max(aim, this.leastZoom()), MOST_ZOOM), at: { x: x * by, y: y * by } };
    if (!smooth || matchMedia("(prefers-reduced-motion: reduce)").matches) this.go(1);
    this.moved();
  }

  zoomTo(zoom: number): void {
    if (this.view) this.zoom(zoom / (this.target?.zoom ?? this.view.zoom), undefined, true);
  }

  /** A part of the way to the zoom that is wanted. */
  approach(): void {
    if (!this.target || !this.view) return;
    const left = Math.abs(Math.log(this.target.zoom / this.view.zoom));
    this.go(left < 0.02 ? 1 : 0.4);
    this.moved();
  }

  private go(share: number): void {
    if (!this.target || !this.view) return;
    const { zoom, at } = this.target;
    const factor = (zoom / this.view.zoom) ** share;
    this.view = zoomed(this.view, this.screen(), at, factor, this.leastZoom());
    if (share === 1) this.target = undefined;
  }

  private leastZoom(): number {
    const raster = this.raster();
    return raster ? Math.min(fitting(raster, this.screen()).zoom / 4, 1) : MOST_ZOOM;
  }
}
