// The page begins here.
import { App } from "./app.js";
import type { FirstPicture } from "./first.js";
import { byId } from "./dom.js";
import { listenToTheme } from "./theme.js";

interface Globals {
  viewer?: App;
  firstPicture?: FirstPicture;
}

function tell(error: unknown): void {
  document.body.classList.remove("alone");
  byId("problem").hidden = false;
  byId("problem-title").textContent = "The viewer cannot start";
  byId("problem-detail").textContent = error instanceof Error ? error.message : String(error);
}

function start(page: Globals): void {
  try {
    page.viewer = new App(page.firstPicture);
    page.viewer.begun.catch(tell);
  } catch (error) {
    tell(error);
  }
}

listenToTheme();
const page = globalThis as Globals;
if (page.firstPicture) void page.firstPicture.over.then(() => start(page));
else start(page);
