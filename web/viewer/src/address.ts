// The address of the page tells what it shows.
const SETTLE = 350; // milliseconds without a change before it is written

export class Address {
  private timer = 0;
  private push = false;

  /** @param link The text behind the #; nothing while there is none, or it is about to change by itself. */
  constructor(private readonly link: () => string | undefined) {}

  /** Sees to it that the address tells what is shown; as a step of its own to go back by, if it is one. */
  remember(push: boolean): void {
    this.push ||= push;
    clearTimeout(this.timer);
    this.timer = window.setTimeout(() => this.write(), SETTLE);
  }

  /** Leaves the address as it is, for it was the address that changed. */
  forget(): void {
    this.push = false;
    clearTimeout(this.timer);
  }

  write(): void {
    clearTimeout(this.timer);
    const link = this.link();
    if (link === undefined) return;
    const hash = `#${link}`;
    const push = this.push && hash !== location.hash;
    this.push = false;
    if (hash === location.hash && !location.search) return;
    const url = `${location.pathname}${hash}`;
    if (push) history.pushState(null, "", url);
    else history.replaceState(null, "", url);
  }
}
