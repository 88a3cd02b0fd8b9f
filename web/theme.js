// Light or dark, as the shell around the page is set; by itself the page follows the browser.

const KEY = "shell:style";
const system = window.matchMedia("(prefers-color-scheme: dark)");

function apply(style) {
  const wanted = style || window.localStorage.getItem(KEY) || "auto";
  const isDark = wanted === "dark" || (wanted === "auto" && system.matches);
  document.documentElement.classList.toggle("dark", isDark);
}

export function followTheme() {
  window.addEventListener("storage", (event) => event.key === KEY && apply());
  window.addEventListener("cockpit-style", (event) => apply(event.detail && event.detail.style));
  system.addEventListener("change", () => apply());
  apply();
}
