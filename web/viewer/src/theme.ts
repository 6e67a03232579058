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

const isDark = (choice: string | null): boolean => choice === "dark" || (choice !== "light" && system.matches);

/** Takes up the choice of last time, or the system's. */
export function takeTheme(): void {
  document.documentElement.dataset["theme"] = isDark(stored()) ? "dark" : "light";
}

/** Takes up the choice of last time, and makes the button change it. The style knows one word for dark: of the page. */
export function listenToTheme(): void {
  const button = byId("theme");
  const root = document.documentElement;
  let choice = stored();
  const refresh = (): void => {
    const dark = isDark(choice);
    root.dataset["theme"] = dark ? "dark" : "light";
    button.setAttribute("aria-pressed", String(dark));
  };
  button.addEventListener("click", () => {
    choice = root.dataset["theme"] === "dark" ? "light" : "dark";
    try {
      localStorage.setItem(KEY, choice);
    } catch {
      // it holds for this page alone
    }
    refresh();
  });
  system.addEventListener("change", refresh);
  refresh();
}
