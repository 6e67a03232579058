// Dark or light: as the system says, until the user says otherwise.
import { byId } from "./dom.js";

const KEY = "zmcraster-theme";
const system = matchMedia("(prefers-color-scheme: dark)");

function stored(): string | null {
  try {
    return localStorage.getItem(KEY);
  } catch {
    return null; // where pages may keep nothing
  }
}

function isDark(): boolean {
  const chosen = document.documentElement.dataset["theme"];
  return chosen ? chosen === "dark" : system.matches;
}

/** Takes up the choice of last time, and makes the button change it. */
export function listenToTheme(): void {
  const button = byId("theme");
  const choice = stored();
  if (choice === "dark" || choice === "light") document.documentElement.dataset["theme"] = choice;
  const refresh = (): void => button.setAttribute("aria-pressed", String(isDark()));
  button.addEventListener("click", () => {
    const theme = isDark() ? "light" : "dark";
    document.documentElement.dataset["theme"] = theme;
    try {
      localStorage.setItem(KEY, theme);
    } catch {
      // it holds for this page alone
    }
    refresh();
  });
  system.addEventListener("change", refresh);
  refresh();
}
