// The record that is selected in the timeline, in full.
import { clock, data, element, errorKind, processName, rowName } from "./data.js";
import { componentColor } from "./theme.js";
import { onSelection } from "./timeline.js";

function fact(list, name, value) {
  list.append(element("dt", "", name), value instanceof Node ? value : element("dd", "", value));
}

function componentFact(index) {
  const swatch = element("span", "swatch");
  swatch.style.background = componentColor(index);
  const fact = element("dd");
  fact.append(swatch, data.components[index].name);
  return fact;
}

export function startDetails() {
  const box = document.getElementById("details");
  const show = (row, index) => {
    if (!row || index < 0) {
      box.replaceChildren(element("p", "muted", "Select a record to see it here."));
      return;
    }
    const list = element("dl");
    fact(list, "Time", `${clock.stamp(row.second[index], row.ns[index])} ${clock.zone}`);
    fact(list, "Component", componentFact(row.comp[index]));
    fact(list, "Kind", data.kinds[row.kind[index]]);
    fact(list, "Process", processName(row.process));
    fact(list, "Thread", rowName(row));
    const text = element("pre", row.kind[index] === errorKind ? "is-error" : "", row.text[index] || "(no contents)");
    box.replaceChildren(list, text);
  };
  if (data.rows.length === 0) return;
  show(null, -1);
  onSelection(show);
}
