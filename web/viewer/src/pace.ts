// How finely pictures are drawn while one change of style follows another, as when a handle is dragged: in all their
// pixels where that takes no longer than a frame of the screen, else in fewer, until the hand rests.
export const REST = 120; // milliseconds without a change after which all pixels are drawn
const FRAME = 1000 / 60;

export class Pace {
  private last = -Infinity;
  private following = false;
  private timer = 0;
  /** Milliseconds that the last picture in all its pixels took, once that is known. */
  took = 0;

  /** @param rest Is called when changes have come to an end after which not all pixels were drawn. */
  constructor(private readonly rest: () => void) {}

  /** There is a change. */
  changed(): void {
    const now = performance.now();
    this.following = now - this.last < REST;
    this.last = now;
    clearTimeout(this.timer);
    this.timer = window.setTimeout(() => this.settle(), REST);
  }

  private settle(): void {
    const { coarse } = this;
    this.timer = 0;
    this.following = false;
    if (coarse) this.rest();
  }

  /** Whether what is drawn now need not have all pixels. */
  get coarse(): boolean {
    return this.following && this.took > FRAME;
  }

  /** Whether the next picture is one of several, whose time matters. */
  get matters(): boolean {
    return this.timer !== 0;
  }
}
