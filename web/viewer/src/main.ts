// The page begins here.
import { App } from "./app.js";
import { byId } from "./dom.js";
import { listenToTheme } from "./theme.js";

listenToTheme();
try {
  (globalThis as { viewer?: App }).viewer = new App();
} catch (error) {
  byId("problem").hidden = false;
  byId("problem-title").textContent = "The viewer cannot start";
  byId("problem-detail").textContent = error instanceof Error ? error.message : String(error);
}
