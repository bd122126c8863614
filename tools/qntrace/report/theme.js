// The colours of the page as its style has them now, for what is drawn on canvases.
import { data } from "./data.js";

const named = ["text", "muted", "line", "panel", "lane", "select", "error", "loss", "loss-fill", "other"];
const paletteSize = 10;
const listeners = [];

export const theme = { colors: {}, palette: [], font: "" };

function read() {
  const style = getComputedStyle(document.documentElement);
  for (const name of named) theme.colors[name] = style.getPropertyValue(`--${name}`).trim();
  theme.palette = Array.from({ length: paletteSize }, (_, i) => style.getPropertyValue(`--series-${i}`).trim());
  theme.font = `12px ${getComputedStyle(document.body).fontFamily}`;
}

// Components beyond the palette share the colour of "other".
export function componentColor(index) {
  return index < paletteSize && data.components[index].name !== "(other)" ? theme.palette[index] : theme.colors.other;
}

export function onThemeChange(listener) {
  listeners.push(listener);
}

read();
matchMedia("(prefers-color-scheme: dark)").addEventListener("change", () => {
  read();
  for (const listener of listeners) listener();
});
