// The data of the page, taken out of its element. Every text in it came out of a trace: it is only ever set as text.
import { Clock } from "./units.js";

export const data = JSON.parse(document.getElementById("data").textContent);
export const clock = new Clock(data.base, data.zone);

// Columns with one entry a record, in order of time.
for (const row of data.rows) {
  const count = row.s.length;
  row.at = new Float64Array(count); // for drawing
  row.second = new Float64Array(count); // with `ns` exact
  let second = 0;
  for (let i = 0; i < count; i += 1) {
    second += row.s[i];
    row.second[i] = second;
    row.at[i] = second + row.ns[i] / 1e9;
  }
  delete row.s;
}

export const errorKind = data.kinds.indexOf("error");

export const rowName = (row) =>
  row.thread === null ? "other threads" : `0x${row.thread.toString(16).padStart(8, "0")}`;

export const processName = (index) => `${data.processes[index].node} / ${data.processes[index].program}`;

// What is missing at a mark, in words.
export function markText(mark) {
  const records = mark.count === 1 ? "record" : "records";
  switch (mark.what) {
    case "missing":
      return `${mark.count} ${records} missing`;
    case "unfinished":
      return `${mark.count} ${records} unfinished`;
    default:
      return mark.count === 1
        ? "1 page overwritten before it was copied"
        : `${mark.count} pages overwritten before they were copied`;
  }
}

// The index of the first record at or behind a time.
export function firstFrom(row, time) {
  let low = 0;
  let high = row.at.length;
  while (low < high) {
    const middle = (low + high) >> 1;
    if (row.at[middle] < time) low = middle + 1;
    else high = middle;
  }
  return low;
}

// An element with a class and a text.
export function element(name, className, text) {
  const made = document.createElement(name);
  if (className) made.className = className;
  if (text !== undefined) made.textContent = text;
  return made;
}
