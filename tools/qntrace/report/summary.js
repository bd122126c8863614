// The head of the page: its title, the figures, what there is to note, the components with their colours and the
// stretch of time that the charts show.
import { clock, data, element } from "./data.js";
import { componentColor, onThemeChange } from "./theme.js";
import { byteText, compact, durationText, grouped, plural } from "./units.js";
import { isolateComponent, isWhole, onViewChange, showAll, span, toggleComponent, view } from "./view.js";

const mostNames = 4;

function figure(name, value, note, mood) {
  const box = element("div", mood ? `figure ${mood}` : "figure");
  const description = element("dd", "", value);
  if (note) description.append(element("span", "muted small", note));
  box.append(element("dt", "", name), description);
  return box;
}

const names = (list) =>
  list.length > mostNames ? `${list.slice(0, mostNames).join(", ")} and ${list.length - mostNames} more` : list.join(", ");

function figures() {
  const { summary } = data;
  const { losses } = summary;
  const lost = losses.unfinished + losses.missing;
  const rate = summary.first && summary.last.at > summary.first.at
    ? `${compact(summary.records / (summary.last.at - summary.first.at))} per second`
    : "";
  const lostText = lost > 0 || losses.unspooled_pages === 0 ? grouped(lost) : plural(losses.unspooled_pages, "page");
  document.getElementById("figures").append(
    figure("Records", grouped(summary.records), rate),
    figure("Bytes", byteText(summary.bytes), `in ${plural(summary.files, "file")}`),
    figure("Errors", grouped(summary.errors), plural(data.errors.groups, "group"), summary.errors > 0 && "bad"),
    figure("Lost", lostText, summary.lost || "nothing that the files tell of", summary.lost !== "" && "lossy"),
    figure("Nodes", grouped(summary.nodes.length), names(summary.nodes)),
    figure("Programs", grouped(summary.programs.length), names(summary.programs)),
  );
}

function headline() {
  const { summary } = data;
  document.getElementById("title").textContent = data.title;
  const range = document.getElementById("span");
  if (summary.first) {
    const length = summary.last.at - summary.first.at;
    const text = (time) => clock.text(time, Math.max(length, 1e-9));
    range.textContent = `${text(summary.first.at)} to ${text(summary.last.at)} ${clock.zone}, ${durationText(length)}`;
  } else {
    range.textContent = "No records with a time";
  }
  if (summary.selection) {
    const selection = document.getElementById("selection");
    selection.hidden = false;
    selection.append("Selected by ", element("code", "", summary.selection));
  }
}

function notes() {
  if (data.notes.length === 0) return;
  const list = document.getElementById("notes");
  list.hidden = false;
  for (const note of data.notes) list.append(element("li", "", note));
}

function legend() {
  const box = document.getElementById("legend");
  const chips = data.components.map((component, i) => {
    const chip = element("button", "chip");
    chip.type = "button";
    chip.title = `${grouped(component.records)} records, ${byteText(component.bytes)}. Double-click: this one alone.`;
    const swatch = element("span", "swatch");
    chip.append(swatch, element("span", "chip-name", component.name || "(none)"));
    chip.append(element("span", "muted", compact(component.records)));
    chip.addEventListener("click", () => toggleComponent(i));
    chip.addEventListener("dblclick", () => isolateComponent(i));
    return chip;
  });
  const paint = () =>
    chips.forEach((chip, i) => {
      chip.setAttribute("aria-pressed", String(!view.hidden.has(i)));
      chip.firstChild.style.background = componentColor(i);
    });
  paint();
  box.append(...chips);
  onThemeChange(paint);
  onViewChange(paint);
}

function range() {
  const output = document.getElementById("range");
  const reset = document.getElementById("reset");
  reset.addEventListener("click", showAll);
  const show = () => {
    reset.disabled = isWhole();
    output.textContent = data.summary.first ? `${durationText(span())} shown` : "";
  };
  show();
  onViewChange(show);
}

export function startSummary() {
  headline();
  figures();
  notes();
  legend();
  range();
}
