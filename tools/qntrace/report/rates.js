// The chart of how many records there are in a second: an area for each component, one above the other, the one with
// the most records at the bottom. What is missing and errors are marked.
import { clock, data, element, errorKind, markText } from "./data.js";
import { componentColor, onThemeChange, theme } from "./theme.js";
import { hideTooltip, showTooltip } from "./tooltip.js";
import { compact, tickStep } from "./units.js";
import { onViewChange, showAll, showRange, span, view, zoomAt, zoomByWheel } from "./view.js";

const height = 240;
const axisHeight = 30;
const axisWidth = 58; // with the legend as wide as the names of the timeline's rows, so that times are below each other
const edge = 34; // half of the widest text of a tick
const mostInTooltip = 10;

// The first column are the times, the others the areas from the topmost on: each is painted over by the next one.
function stacked() {
  const { begin, width, counts } = data.rates;
  const buckets = counts[0].length;
  // One point more, for the end of the last bucket.
  const times = Array.from({ length: buckets + 1 }, (_, i) => begin + i * width);
  const areas = [];
  let below = new Array(buckets + 1).fill(0);
  counts.forEach((records, component) => {
    if (!view.hidden.has(component)) {
      below = below.map((sum, i) => sum + records[Math.min(i, buckets - 1)] / width);
    }
    areas.push(below);
  });
  return [times, ...areas.reverse()];
}

function drawMarks(chart) {
  const { ctx, bbox } = chart;
  const ratio = devicePixelRatio;
  ctx.save();
  ctx.beginPath();
  ctx.rect(bbox.left, bbox.top, bbox.width, bbox.height);
  ctx.clip();
  for (const mark of data.marks) {
    const left = chart.valToPos(mark.from, "x", true);
    const right = Math.max(chart.valToPos(mark.to, "x", true), left + 2 * ratio);
    ctx.fillStyle = theme.colors["loss-fill"];
    ctx.fillRect(left, bbox.top, right - left, bbox.height);
    ctx.fillStyle = theme.colors.loss;
    ctx.fillRect(left, bbox.top, right - left, 4 * ratio);
  }
  ctx.fillStyle = theme.colors.error;
  let last = -1;
  for (const time of errorTimes) {
    const x = Math.round(chart.valToPos(time, "x", true));
    if (x - last < 3 * ratio) continue;
    last = x;
    const size = 4 * ratio;
    const bottom = bbox.top + bbox.height;
    ctx.beginPath();
    ctx.moveTo(x - size, bottom);
    ctx.lineTo(x + size, bottom);
    ctx.lineTo(x, bottom - 2 * size);
    ctx.fill();
  }
  ctx.restore();
}

const errorTimes = data.rows
  .flatMap((row) => Array.from(row.at).filter((_, i) => row.kind[i] === errorKind))
  .sort((left, right) => left - right);

function bucketTooltip(bucket) {
  const { begin, width, counts } = data.rates;
  const from = begin + bucket * width;
  const lines = [element("div", "tooltip-head", clock.text(from, Math.min(span(), width * 100)))];
  const shown = counts
    .map((records, component) => ({ component, records: records[bucket] }))
    .filter(({ component, records }) => records > 0 && !view.hidden.has(component));
  const table = element("table");
  for (const { component, records } of shown.slice(0, mostInTooltip)) {
    const row = table.insertRow();
    const swatch = element("span", "swatch");
    swatch.style.background = componentColor(component);
    row.insertCell().append(swatch, data.components[component].name);
    row.insertCell().textContent = `${compact(records / width)}/s`;
  }
  if (shown.length > mostInTooltip) {
    table.insertRow().insertCell().textContent = `and ${shown.length - mostInTooltip} more`;
  }
  lines.push(shown.length > 0 ? table : element("div", "muted", "no records"));
  for (const mark of data.marks) {
    if (mark.to >= from && mark.from <= from + width) {
      lines.push(element("div", "tooltip-loss", `${markText(mark)} (${mark.trace})`));
    }
  }
  return lines.slice(0, mostInTooltip);
}

function options(container) {
  const axis = {
    stroke: theme.colors.muted,
    font: theme.font,
    grid: { stroke: theme.colors.line, width: 1 },
    ticks: { stroke: theme.colors.line, width: 1, size: 5 },
  };
  const step = (chart) => tickStep(span(), chart.width / 110);
  const series = data.components.map((_, component) => ({
    fill: componentColor(component),
    width: 0,
    points: { show: false },
    paths: uPlot.paths.stepped({ align: 1 }),
  }));
  return {
    width: container.clientWidth,
    height,
    legend: { show: false },
    padding: [8, 1, 0, 0],
    scales: {
      x: { time: false, range: () => [view.from, view.to] },
      y: { range: (_, __, most) => [0, most > 0 ? most * 1.08 : 1] },
    },
    axes: [
      {
        ...axis,
        size: axisHeight,
        splits: (chart) => {
          const perPixel = span() / (chart.width - axisWidth);
          return clock.ticks(view.from + edge * perPixel, view.to - edge * perPixel, step(chart));
        },
        values: (chart, times) => times.map((time) => clock.tickText(time, step(chart))),
      },
      { ...axis, size: axisWidth, values: (_, rates) => rates.map(compact) },
    ],
    series: [{}, ...series.reverse()],
    cursor: {
      y: false,
      points: { show: false },
      drag: { x: true, y: false, setScale: false },
      bind: { dblclick: () => () => showAll() },
    },
    hooks: {
      draw: [drawMarks],
      setSelect: [
        (chart) => {
          const { left, width } = chart.select;
          if (width < 3) return;
          showRange(chart.posToVal(left, "x"), chart.posToVal(left + width, "x"));
          chart.setSelect({ left: 0, top: 0, width: 0, height: 0 }, false);
        },
      ],
    },
  };
}

function follow(chart) {
  const over = chart.over;
  const timeAt = (event) => chart.posToVal(event.clientX - over.getBoundingClientRect().left, "x");
  zoomByWheel(over, timeAt);
  over.addEventListener("pointermove", (event) => {
    const bucket = Math.floor((timeAt(event) - data.rates.begin) / data.rates.width);
    if (bucket < 0 || bucket >= data.rates.counts[0].length) hideTooltip();
    else showTooltip(event, bucketTooltip(bucket));
  });
  over.addEventListener("pointerleave", hideTooltip);
}

function zoomByKeys(container) {
  container.tabIndex = 0;
  container.addEventListener("keydown", (event) => {
    const middle = (view.from + view.to) / 2;
    if (event.key === "+" || event.key === "=") zoomAt(middle, 0.5);
    else if (event.key === "-") zoomAt(middle, 2);
    else if (event.key === "ArrowLeft") showRange(view.from - span() * 0.2, view.to - span() * 0.2);
    else if (event.key === "ArrowRight") showRange(view.from + span() * 0.2, view.to + span() * 0.2);
    else if (event.key === "0") showAll();
    else return;
    event.preventDefault();
  });
}

export function startRates() {
  const container = document.getElementById("rates");
  if (!data.rates) {
    container.replaceWith(element("p", "empty", "No records with a time."));
    return;
  }
  document.getElementById("rates-unit").textContent = `records per second, in steps of ${data.rates.width_text}`;
  container.setAttribute("role", "img");
  container.setAttribute("aria-label", "Records per second over time, by component. Plus and minus zoom, arrows move.");
  let chart = null;
  let hidden = null; // what the areas were last made for
  const build = () => {
    if (chart) chart.destroy();
    hidden = [...view.hidden].join();
    chart = new uPlot(options(container), stacked(), container);
    follow(chart);
  };
  const update = () => {
    if (hidden === [...view.hidden].join()) {
      chart.setScale("x", { min: view.from, max: view.to });
      return;
    }
    hidden = [...view.hidden].join();
    chart.setData(stacked());
  };
  build();
  zoomByKeys(container);
  onThemeChange(build);
  onViewChange(update);
  new ResizeObserver(() => chart.setSize({ width: container.clientWidth, height })).observe(container);
}
