// The table of errors, as `qntrace errors` groups them. Its heads sort it; the time of the last one leads to its record
// in the timeline.
import { data, element } from "./data.js";
import { selectAt } from "./timeline.js";
import { grouped, plural } from "./units.js";

const rowsAtFirst = 100;
const mostNodes = 5; // in a row

const place = ({ source_file: file, line, function: name }) =>
  [file || line ? `${file ?? "?"}:${line}` : "", name ? `in ${name}` : ""].filter(Boolean).join(" ");

const ids = (latest) => {
  const message = `error ${latest.error_id}, set ${latest.message_set} message ${latest.message_number}`;
  return latest.catalogue === null ? message : `${message} of ${latest.catalogue}`;
};

const columns = [
  { name: "Count", key: (group) => group.errors, number: true, text: (group) => grouped(group.errors) },
  { name: "Message", key: (group) => group.latest.message, style: "message" },
  { name: "Component", key: (group) => group.latest.comp },
  { name: "Nodes", key: (group) => group.nodes[0].node, style: "nodes" },
  { name: "Program", key: (group) => group.latest.program },
  { name: "First", key: (group) => group.first.time ?? "", style: "time" },
  { name: "Last", key: (group) => group.last.time ?? "", style: "time" },
];

// "2026-11-21T05:12:01.123456789+01:00": the time above its date; the zone is that of the whole page.
function timeParts(text) {
  const [date, time] = text.split("T");
  return [element("div", "", time.slice(0, 15)), element("div", "muted small", date)];
}

function messageCell(cell, group) {
  cell.append(element("div", "", group.latest.message));
  const below = [ids(group.latest), place(group.latest), group.latest.ffdc_id ? `ffdc ${group.latest.ffdc_id}` : ""];
  cell.append(element("div", "muted small", below.filter(Boolean).join("  ·  ")));
}

function nodesCell(cell, group) {
  for (const { node, errors } of group.nodes.slice(0, mostNodes)) {
    cell.append(element("div", "", `${node} ${grouped(errors)}`));
  }
  const more = group.nodes.length - mostNodes;
  if (more > 0) cell.append(element("div", "muted small", `and ${plural(more, "node")} more`));
}

function lastCell(cell, group) {
  if (group.at === null || !group.last.time) {
    cell.textContent = "-";
    return;
  }
  const button = element("button", "link");
  button.type = "button";
  button.append(...timeParts(group.last.time));
  button.title = "Show it in the timeline";
  button.addEventListener("click", () => {
    if (selectAt(group.at)) document.getElementById("timeline").scrollIntoView({ block: "center" });
  });
  cell.append(button);
}

function fill(body, groups) {
  body.replaceChildren();
  for (const group of groups) {
    const row = body.insertRow();
    for (const column of columns) {
      const cell = row.insertCell();
      cell.className = column.number ? "number" : (column.style ?? "");
      if (column.name === "Message") messageCell(cell, group);
      else if (column.name === "Nodes") nodesCell(cell, group);
      else if (column.name === "Last") lastCell(cell, group);
      else if (column.name === "First") cell.append(...(group.first.time ? timeParts(group.first.time) : ["-"]));
      else cell.textContent = column.text ? column.text(group) : column.key(group);
    }
  }
}

function compare(left, right) {
  if (left === right) return 0;
  return left < right ? -1 : 1;
}

export function startErrors() {
  const container = document.getElementById("errors");
  const { rows, groups } = data.errors;
  if (rows.length === 0) {
    container.append(element("p", "empty", "No error records."));
    return;
  }
  document.getElementById("errors-count").textContent =
    `${plural(data.summary.errors, "error")} in ${plural(groups, "group")}`;
  const table = element("table", "errors");
  const head = table.createTHead().insertRow();
  const body = table.createTBody();
  let limit = rowsAtFirst;
  let sorted = { column: 0, down: true };
  const more = element("button", "", `Show all ${grouped(rows.length)}`);
  more.type = "button";

  const show = () => {
    const { key } = columns[sorted.column];
    const ordered = [...rows].sort((left, right) => compare(key(left), key(right)) * (sorted.down ? -1 : 1));
    fill(body, ordered.slice(0, limit));
    more.hidden = limit >= rows.length;
    [...head.cells].forEach((cell, i) => {
      cell.setAttribute("aria-sort", i !== sorted.column ? "none" : sorted.down ? "descending" : "ascending");
    });
  };
  columns.forEach((column, i) => {
    const cell = element("th", column.number ? "number" : "");
    cell.scope = "col";
    const button = element("button", "", column.name);
    button.type = "button";
    button.addEventListener("click", () => {
      sorted = { column: i, down: sorted.column === i ? !sorted.down : column.number === true || column.name === "Last" };
      show();
    });
    cell.append(button);
    head.append(cell);
  });
  more.addEventListener("click", () => {
    limit = rows.length;
    show();
  });
  show();
  container.append(table, more);
}
