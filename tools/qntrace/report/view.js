// What both charts show: the stretch of time and the components. Whoever changes it calls a function of this module,
// and everybody else hears of it once before the next picture.
import { data } from "./data.js";

const shortest = 20e-9; // seconds; a nanosecond is what times can tell apart
const listeners = [];
let announced = false;

function wholeRange() {
  if (!data.summary.first) return { from: 0, to: 1 };
  const from = data.summary.first.at;
  const to = data.summary.last.at;
  const margin = Math.max((to - from) * 0.015, shortest);
  return { from: from - margin, to: to + margin };
}

export const whole = wholeRange();
export const view = { ...whole, hidden: new Set() };

export function onViewChange(listener) {
  listeners.push(listener);
}

function announce() {
  if (announced) return;
  announced = true;
  requestAnimationFrame(() => {
    announced = false;
    for (const listener of listeners) listener();
  });
}

export const isWhole = () => view.from === whole.from && view.to === whole.to;
export const span = () => view.to - view.from;

export function showRange(from, to) {
  const least = Math.min(shortest, whole.to - whole.from);
  if (to - from < least) {
    const middle = (from + to) / 2;
    from = middle - least / 2;
    to = middle + least / 2;
  }
  const length = Math.min(to - from, whole.to - whole.from);
  view.from = Math.min(Math.max(from, whole.from), whole.to - length);
  view.to = length === whole.to - whole.from ? whole.to : view.from + length;
  announce();
}

export function showAll() {
  showRange(whole.from, whole.to);
}

// A factor above 1 shows more.
export function zoomAt(time, factor) {
  showRange(time - (time - view.from) * factor, time + (view.to - time) * factor);
}

export function move(byShare) {
  const by = span() * byShare;
  showRange(view.from + by, view.to + by);
}

// Moves as little as needed to have the time in sight.
export function bringIntoView(time) {
  const margin = span() * 0.1;
  if (time < view.from + margin) showRange(time - margin, time - margin + span());
  else if (time > view.to - margin) showRange(time + margin - span(), time + margin);
}

export function toggleComponent(index) {
  if (!view.hidden.delete(index)) view.hidden.add(index);
  announce();
}

// Shows this one alone; all of them when it is alone already.
export function isolateComponent(index) {
  const others = data.components.map((_, i) => i).filter((i) => i !== index);
  const alone = !view.hidden.has(index) && others.every((i) => view.hidden.has(i));
  view.hidden = new Set(alone ? [] : others);
  announce();
}

// Turning the wheel zooms at the pointer, with Shift it moves. Where there is nothing more to zoom, the page scrolls.
export function zoomByWheel(target, timeAt) {
  target.addEventListener(
    "wheel",
    (event) => {
      const along = event.shiftKey ? event.deltaY || event.deltaX : event.deltaX;
      const time = timeAt(event);
      if (time === null) return;
      if (event.shiftKey || Math.abs(event.deltaX) > Math.abs(event.deltaY)) {
        move(Math.sign(along) * 0.1);
      } else {
        if (event.deltaY > 0 && isWhole()) return;
        zoomAt(time, event.deltaY > 0 ? 1.25 : 0.8);
      }
      event.preventDefault();
    },
    { passive: false },
  );
}
