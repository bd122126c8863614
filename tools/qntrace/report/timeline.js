// The timeline: its canvas, what the pointer and the keys do with it, and which record is selected.
//
// The canvas is as high as what can be seen and stands still in a box that scrolls, so that thousands of rows cost no
// more than those in sight.
import { clock, data, element, errorKind, firstFrom, markText } from "./data.js";
import { axisHeight, gutterOf, itemAt, itemOf, LaneDrawing, lanes, recordNear } from "./lanes.js";
import { onThemeChange } from "./theme.js";
import { hideTooltip, showTooltip } from "./tooltip.js";
import { bringIntoView, move, onViewChange, showAll, showRange, span, view, zoomAt, zoomByWheel } from "./view.js";

const highest = 460;
const reach = 5; // pixels around the pointer in which a record is meant
const longestInTooltip = 600;

const state = { width: 0, height: 0, scroll: 0, row: null, index: -1, drag: null };
const selectionListeners = [];
const box = element("div", "timeline-scroll");
const filler = element("div", "timeline-filler");
const canvas = element("canvas");
let waiting = false;

function redraw() {
  if (waiting) return;
  waiting = true;
  requestAnimationFrame(() => {
    waiting = false;
    const context = canvas.getContext("2d");
    context.setTransform(devicePixelRatio, 0, 0, devicePixelRatio, 0, 0);
    state.scroll = box.scrollTop;
    new LaneDrawing(context, state).draw();
  });
}

function resize() {
  state.width = box.clientWidth;
  state.height = Math.min(highest, lanes.height + axisHeight);
  canvas.style.width = `${state.width}px`;
  canvas.style.height = `${state.height}px`;
  canvas.width = Math.round(state.width * devicePixelRatio);
  canvas.height = Math.round(state.height * devicePixelRatio);
  redraw();
}

const timePerPixel = () => span() / (state.width - gutterOf(state.width));

// Where an event is: nothing left of the first time and above the first row.
function placeOf(event) {
  const bounds = canvas.getBoundingClientRect();
  const x = event.clientX - bounds.left;
  const y = event.clientY - bounds.top;
  const time = x < gutterOf(state.width) ? null : view.from + (x - gutterOf(state.width)) * timePerPixel();
  const item = y < axisHeight ? null : itemAt(y - axisHeight + state.scroll);
  return { x, time, item };
}

function select(row, index) {
  state.row = row;
  state.index = index;
  redraw();
  for (const listener of selectionListeners) listener(row, index);
}

function revealRow(row) {
  const item = itemOf(row);
  const room = state.height - axisHeight;
  if (item.top < box.scrollTop) box.scrollTop = item.top;
  else if (item.top + item.height > box.scrollTop + room) box.scrollTop = item.top + item.height - room;
}

function selectAndReveal(row, index) {
  if (index >= 0) bringIntoView(row.at[index]);
  revealRow(row);
  select(row, index);
}

const isShown = (row, i) => !view.hidden.has(row.comp[i]);

function step(by) {
  const row = state.row ?? data.rows[0];
  let i = state.row && state.index >= 0 ? state.index + by : firstFrom(row, view.from);
  while (i >= 0 && i < row.at.length && !isShown(row, i)) i += by;
  if (i >= 0 && i < row.at.length) selectAndReveal(row, i);
}

// To the record of the neighbouring row that is nearest in time.
function stepRow(by) {
  const at = data.rows.indexOf(state.row) + by;
  const row = data.rows[Math.min(Math.max(at, 0), data.rows.length - 1)];
  const time = state.row && state.index >= 0 ? state.row.at[state.index] : (view.from + view.to) / 2;
  selectAndReveal(row, recordNear(row, time, Infinity));
}

// The next one in time in any row, beginning again behind the last.
function nextError() {
  const now = state.row && state.index >= 0 ? state.row.at[state.index] : -Infinity;
  const errors = data.rows.flatMap((row) =>
    row.kind.map((kind, index) => ({ row, index, kind })).filter(({ kind, index }) => kind === errorKind && isShown(row, index)),
  );
  errors.sort((left, right) => left.row.at[left.index] - right.row.at[right.index]);
  const next = errors.find(({ row, index }) => row.at[index] > now) ?? errors[0];
  if (next) selectAndReveal(next.row, next.index);
}

// Selects the record at that time whose component and kind are given; tells whether it is there.
export function selectAt(time) {
  for (const row of data.rows) {
    for (let i = firstFrom(row, time); i < row.at.length && row.at[i] === time; i += 1) {
      if (row.kind[i] !== errorKind) continue;
      const around = Math.min(span(), Math.max(span() / 10, 1e-6));
      showRange(time - around / 2, time + around / 2);
      revealRow(row);
      select(row, i);
      return true;
    }
  }
  return false;
}

export function onSelection(listener) {
  selectionListeners.push(listener);
}

const keys = {
  ArrowLeft: () => step(-1),
  ArrowRight: () => step(1),
  ArrowUp: () => stepRow(-1),
  ArrowDown: () => stepRow(1),
  "+": () => zoomAt(middle(), 0.5),
  "=": () => zoomAt(middle(), 0.5),
  "-": () => zoomAt(middle(), 2),
  "[": () => move(-0.25),
  "]": () => move(0.25),
  e: nextError,
  0: showAll,
  Escape: () => select(null, -1),
};

// Of what is selected and in sight, or else of what is shown.
function middle() {
  const time = state.row && state.index >= 0 ? state.row.at[state.index] : null;
  return time !== null && time >= view.from && time <= view.to ? time : (view.from + view.to) / 2;
}

function tooltipFor({ item, time }) {
  if (!item || time === null) return null;
  const index = item.row ? recordNear(item.row, time, reach * timePerPixel()) : -1;
  if (index >= 0) {
    const { row } = item;
    const text = row.text[index];
    return [
      element("div", "tooltip-head", clock.stamp(row.second[index], row.ns[index])),
      element("div", "muted", `${data.components[row.comp[index]].name}  ${data.kinds[row.kind[index]]}`),
      element("pre", "", text.length > longestInTooltip ? `${text.slice(0, longestInTooltip)}…` : text),
    ];
  }
  const close = reach * timePerPixel();
  const marks = data.marks.filter(
    (mark) => mark.process === item.process && time >= mark.from - close && time <= mark.to + close,
  );
  if (marks.length === 0) return null;
  return marks.slice(0, 5).map((mark) => element("div", "tooltip-loss", `${markText(mark)} (${mark.trace})`));
}

function followPointer() {
  canvas.addEventListener("pointerdown", (event) => {
    const place = placeOf(event);
    if (event.button !== 0 || place.time === null) return;
    canvas.setPointerCapture(event.pointerId);
    state.drag = { from: place.x, to: place.x, moves: event.shiftKey, last: place.x };
    box.focus({ preventScroll: true });
    event.preventDefault();
  });
  canvas.addEventListener("pointermove", (event) => {
    const place = placeOf(event);
    if (!state.drag) {
      const content = tooltipFor(place);
      if (content) showTooltip(event, content);
      else hideTooltip();
      return;
    }
    hideTooltip();
    state.drag.to = place.x;
    if (state.drag.moves) {
      const by = (state.drag.last - place.x) * timePerPixel();
      showRange(view.from + by, view.to + by);
      state.drag.last = place.x;
      state.drag.from = place.x;
    }
    redraw();
  });
  canvas.addEventListener("pointerup", (event) => {
    const { drag } = state;
    if (!drag) return;
    state.drag = null;
    redraw();
    if (drag.moves) return;
    const gutter = gutterOf(state.width);
    const timeAt = (x) => view.from + (Math.max(x, gutter) - gutter) * timePerPixel();
    if (Math.abs(drag.to - drag.from) > 4) {
      showRange(timeAt(Math.min(drag.from, drag.to)), timeAt(Math.max(drag.from, drag.to)));
      return;
    }
    const { item, time } = placeOf(event);
    if (item?.row && time !== null) select(item.row, recordNear(item.row, time, reach * timePerPixel()));
  });
  canvas.addEventListener("pointerleave", hideTooltip);
  canvas.addEventListener("dblclick", showAll);
  zoomByWheel(canvas, (event) => placeOf(event).time);
}

export function startTimeline() {
  const container = document.getElementById("timeline");
  if (data.rows.length === 0) {
    container.append(element("p", "empty", "No records with a time."));
    return;
  }
  box.tabIndex = 0;
  box.setAttribute("role", "application");
  box.setAttribute("aria-label", "Timeline of the records of each thread. Arrow keys go from record to record.");
  filler.style.height = `${lanes.height + axisHeight}px`;
  filler.append(canvas);
  box.append(filler);
  container.append(box);
  box.style.maxHeight = `${highest}px`;
  followPointer();
  box.addEventListener("scroll", redraw);
  box.addEventListener("keydown", (event) => {
    const act = event.ctrlKey || event.metaKey || event.altKey ? undefined : keys[event.key];
    if (!act) return;
    act();
    event.preventDefault();
  });
  onViewChange(redraw);
  onThemeChange(redraw);
  new ResizeObserver(resize).observe(container);
}
