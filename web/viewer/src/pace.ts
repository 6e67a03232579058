// How finely pictures are drawn behind a change of style: in all their pixels where that takes no longer than a frame of
// the screen, else in fewer, which show the change at once, until the hand rests.
export const REST = 120; // milliseconds without a change after which all pixels are drawn
const FRAME = 1000 / 60;

export class Pace {
  private resting = true;
  private timer = 0;
  /** Milliseconds that the last picture in all its pixels took, once that is known. */
  took = 0;

  /** @param rest Is called when changes have come to an end after which not all pixels were drawn. */
  constructor(private readonly rest: () => void) {}

  /** There is a change. */
  changed(): void {
    this.resting = false;
    clearTimeout(this.timer);
    this.timer = window.setTimeout(() => this.settle(), REST);
  }

  private settle(): void {
    const { coarse } = this;
    this.resting = true;
    if (coarse) this.rest();
  }

  /** Whether what is drawn now need not have all pixels. */
  get coarse(): boolean {
    return !this.resting && this.took > FRAME;
  }
}
