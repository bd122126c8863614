// Where the rows of the timeline are, and how they are drawn: above all the axis, then each process with its threads.
import { clock, data, errorKind, firstFrom, processName, rowName } from "./data.js";
import { componentColor, theme } from "./theme.js";
import { compact, tickStep } from "./units.js";
import { span, view } from "./view.js";

export const axisHeight = 28;
const processHeight = 26;
const rowHeight = 20;
const tickInset = 4;
const widestGutter = 229; // as far as the rates' legend and axis reach, see report.css

// Rows and the heads of processes, with their places below the axis; of each process where it begins and ends.
function arrange() {
  const items = [];
  const processes = new Map();
  let top = 0;
  for (const row of data.rows) {
    const { process } = row;
    if (!processes.has(process)) {
      processes.set(process, { top, bottom: top });
      items.push({ process, top, height: processHeight });
      top += processHeight;
    }
    items.push({ process, row, top, height: rowHeight });
    top += rowHeight;
    processes.get(process).bottom = top;
  }
  return { items, processes, height: top };
}

export const lanes = arrange();

export const gutterOf = (width) => (width < 680 ? Math.round(width * 0.34) : widestGutter);

export function itemAt(y) {
  return lanes.items.find((item) => y >= item.top && y < item.top + item.height) ?? null;
}

export const itemOf = (row) => lanes.items.find((item) => item.row === row);

// The record nearest to a time and not further away than `reach`; of the components that are shown.
export function recordNear(row, time, reach) {
  let best = -1;
  for (let i = firstFrom(row, time - reach); i < row.at.length && row.at[i] <= time + reach; i += 1) {
    if (view.hidden.has(row.comp[i])) continue;
    const isNearer = best < 0 || Math.abs(row.at[i] - time) < Math.abs(row.at[best] - time);
    const isError = row.kind[i] === errorKind && best >= 0 && row.kind[best] !== errorKind;
    if (isNearer || isError) best = i;
  }
  return best;
}

// What is drawn on: `width` and `height` of the picture, how far it is scrolled, what is selected and dragged over.
export class LaneDrawing {
  constructor(context, state) {
    this.context = context;
    this.state = state;
    this.gutter = gutterOf(state.width);
    this.scale = (state.width - this.gutter) / span();
  }

  x(time) {
    return this.gutter + (time - view.from) * this.scale;
  }

  draw() {
    const { context, state } = this;
    context.fillStyle = theme.colors.panel;
    context.fillRect(0, 0, state.width, state.height);
    const step = tickStep(span(), (state.width - this.gutter) / 110);
    const ticks = clock.ticks(view.from, view.to, step);
    context.save();
    context.beginPath();
    context.rect(0, axisHeight, state.width, state.height - axisHeight);
    context.clip();
    context.translate(0, axisHeight - state.scroll);
    const shown = lanes.items.filter(
      (item) => item.top + item.height > state.scroll && item.top < state.scroll + state.height - axisHeight,
    );
    for (const item of shown) this.background(item);
    context.restore();
    this.grid(ticks);
    context.save();
    context.beginPath();
    context.rect(0, axisHeight, state.width, state.height - axisHeight);
    context.clip();
    context.translate(0, axisHeight - state.scroll);
    this.marks();
    for (const item of shown) {
      if (item.row) this.row(item);
      else this.label(item, processName(item.process), "", theme.colors.text, `600 ${theme.font}`);
    }
    this.selected();
    context.restore();
    this.axis(ticks, step);
    this.drag();
  }

  background(item) {
    const { context, state } = this;
    context.fillStyle = theme.colors[item.row && item.row === state.row ? "select" : item.row ? "panel" : "lane"];
    context.fillRect(0, item.top, state.width, item.height);
  }

  grid(ticks) {
    const { context, state } = this;
    context.fillStyle = theme.colors.line;
    for (const time of ticks) context.fillRect(Math.round(this.x(time)), axisHeight, 1, state.height - axisHeight);
    context.fillRect(this.gutter, axisHeight, 1, state.height - axisHeight);
  }

  // Over all rows of the process from whose traces something is missing.
  marks() {
    const { context } = this;
    for (const mark of data.marks) {
      if (mark.to < view.from || mark.from > view.to) continue;
      const process = lanes.processes.get(mark.process);
      if (!process) continue;
      const left = Math.max(this.x(mark.from), this.gutter);
      const right = Math.max(this.x(mark.to), left + 2);
      context.fillStyle = theme.colors["loss-fill"];
      context.fillRect(left, process.top, right - left, process.bottom - process.top);
      context.fillStyle = theme.colors.loss;
      context.fillRect(left, process.top, right - left, 3);
    }
  }

  row(item) {
    const { context } = this;
    const { row } = item;
    const shown = row.at.length < row.records ? `${compact(row.at.length)} of ${compact(row.records)}` : compact(row.records);
    this.label(item, rowName(row), shown, theme.colors.text, theme.font);
    const top = item.top + tickInset;
    const height = item.height - 2 * tickInset;
    const errors = [];
    let lastX = -1;
    let lastComponent = -1;
    const end = view.to + 2 / this.scale;
    for (let i = firstFrom(row, view.from); i < row.at.length && row.at[i] <= end; i += 1) {
      const component = row.comp[i];
      if (view.hidden.has(component)) continue;
      const x = Math.round(this.x(row.at[i]));
      if (row.kind[i] === errorKind) {
        if (errors[errors.length - 1] !== x) errors.push(x);
        continue;
      }
      if (x === lastX) continue;
      if (component !== lastComponent) context.fillStyle = componentColor(component);
      lastX = x;
      lastComponent = component;
      context.fillRect(x, top, 2, height);
    }
    for (const x of errors) this.error(x, item);
  }

  error(x, item) {
    const { context } = this;
    const top = item.top + 1;
    context.fillStyle = theme.colors.error;
    context.fillRect(x - 0.5, top, 2, item.height - 2);
    context.beginPath();
    context.moveTo(x - 4, top);
    context.lineTo(x + 5, top);
    context.lineTo(x + 0.5, top + 7);
    context.fill();
  }

  label(item, text, note, color, font) {
    const { context, state } = this;
    const middle = item.top + item.height / 2 + 0.5;
    const inset = item.row ? 22 : 10;
    context.textBaseline = "middle";
    context.font = theme.font;
    const room = (item.row ? this.gutter : state.width) - inset - 6;
    const noteWidth = note ? context.measureText(note).width + 8 : 0;
    const hasRoom = context.measureText(text).width + noteWidth <= room;
    if (note && hasRoom) {
      context.fillStyle = theme.colors.muted;
      context.textAlign = "right";
      context.fillText(note, this.gutter - 8, middle);
    }
    context.font = font;
    context.fillStyle = color;
    context.textAlign = "left";
    context.fillText(this.cut(text, room), inset, middle);
  }

  // The heads of processes may be longer than the gutter is wide.
  cut(text, width) {
    const { context } = this;
    if (context.measureText(text).width <= width) return text;
    let length = text.length;
    while (length > 1 && context.measureText(`${text.slice(0, length)}…`).width > width) length -= 1;
    return `${text.slice(0, length)}…`;
  }

  selected() {
    const { context, state } = this;
    if (!state.row || state.index < 0) return;
    const item = itemOf(state.row);
    const x = Math.round(this.x(state.row.at[state.index])) + 1;
    if (x < this.gutter) return;
    context.strokeStyle = theme.colors.text;
    context.lineWidth = 1.5;
    context.strokeRect(x - 4, item.top + 1, 8, item.height - 2);
  }

  axis(ticks, step) {
    const { context, state } = this;
    context.fillStyle = theme.colors.panel;
    context.fillRect(0, 0, state.width, axisHeight);
    context.fillStyle = theme.colors.line;
    context.fillRect(0, axisHeight - 1, state.width, 1);
    context.font = theme.font;
    context.fillStyle = theme.colors.muted;
    context.textBaseline = "middle";
    context.textAlign = "left";
    context.fillText(this.cut("Node / program, threads", this.gutter - 16), 10, axisHeight / 2);
    context.textAlign = "center";
    for (const time of ticks) {
      const x = this.x(time);
      if (x > this.gutter + 34 && x < state.width - 34) context.fillText(clock.tickText(time, step), x, axisHeight / 2);
    }
  }

  drag() {
    const { context, state } = this;
    if (!state.drag) return;
    const left = Math.max(Math.min(state.drag.from, state.drag.to), this.gutter);
    const right = Math.max(state.drag.from, state.drag.to);
    context.fillStyle = theme.colors.select;
    context.globalAlpha = 0.6;
    context.fillRect(left, axisHeight, right - left, state.height - axisHeight);
    context.globalAlpha = 1;
  }
}
