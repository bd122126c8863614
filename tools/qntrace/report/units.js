// Numbers, durations and times as people read them. Times are seconds since the page's base, which is a whole second
// since the epoch; what is shown of them is in the zone of the page.

const smallSteps = [1, 2, 5];
const largeSteps = [1, 2, 5, 10, 15, 30, 60, 120, 300, 600, 900, 1800, 3600, 7200, 10800, 21600, 43200, 86400];
const day = 86400;

export const plural = (number, one) => `${grouped(number)} ${one}${number === 1 ? "" : "s"}`;

export function grouped(number) {
  return number.toLocaleString("en-US");
}

// With three digits and the letter of a power of 1000.
export function compact(number) {
  const letters = ["", "k", "M", "G", "T", "P"];
  let power = 0;
  while (Math.abs(number) >= 999.5 && power + 1 < letters.length) {
    number /= 1000;
    power += 1;
  }
  return `${Number(number.toPrecision(3))}${letters[power]}`;
}

export function byteText(number) {
  const units = ["bytes", "KiB", "MiB", "GiB", "TiB"];
  let power = 0;
  while (number >= 1024 && power + 1 < units.length) {
    number /= 1024;
    power += 1;
  }
  return `${power === 0 ? number : number.toFixed(1)} ${units[power]}`;
}

export function durationText(seconds) {
  if (seconds >= 2 * day) return `${Number((seconds / day).toPrecision(4))} d`;
  if (seconds >= 7200) return `${Number((seconds / 3600).toPrecision(4))} h`;
  if (seconds >= 120) return `${Number((seconds / 60).toPrecision(4))} min`;
  for (const [unit, size] of [["s", 1], ["ms", 1e-3], ["µs", 1e-6]]) {
    if (seconds >= size) return `${Number((seconds / size).toPrecision(4))} ${unit}`;
  }
  return `${Math.round(seconds * 1e9)} ns`;
}

// The distance of ticks so that at most so many lie in the span.
export function tickStep(span, most) {
  const least = span / Math.max(most, 1);
  if (least <= 1) {
    const power = 10 ** Math.floor(Math.log10(Math.max(least, 1e-9)));
    for (const step of smallSteps) if (step * power >= least * (1 - 1e-9)) return step * power;
    return 10 * power;
  }
  for (const step of largeSteps) if (step >= least) return step;
  for (let power = day; ; power *= 10) {
    for (const step of smallSteps) if (step * power >= least) return step * power;
  }
}

export class Clock {
  constructor(base, zone) {
    this.local = BigInt(base) + BigInt(zone.offset_minutes * 60); // the base on the zone's clock
    this.zone = zone.utc ? "UTC" : Clock.offsetText(zone.offset_minutes);
  }

  static offsetText(minutes) {
    const digits = (number) => String(Math.floor(number)).padStart(2, "0");
    const size = Math.abs(minutes);
    return `UTC${minutes < 0 ? "−" : "+"}${digits(size / 60)}:${digits(size % 60)}`;
  }

  // Times in the range that are whole multiples of the step on the zone's clock.
  ticks(from, to, step) {
    const phase = step >= 1 ? Number(this.local % BigInt(step)) : 0;
    const times = [];
    for (let i = Math.ceil((from + phase) / step); i * step - phase <= to; i += 1) times.push(i * step - phase);
    return times;
  }

  // As short as the distance to the next tick allows.
  tickText(time, step) {
    const { date, clock, second, ns } = this.parts(time);
    if (step >= day) return date;
    if (clock === "00:00" && second === "00" && ns === 0) return date.slice(5);
    if (step >= 60) return clock;
    const digits = step >= 1 ? 0 : Math.min(9, Math.ceil(-Math.log10(step) - 1e-9));
    const fraction = digits === 0 ? "" : `.${String(ns).padStart(9, "0").slice(0, digits)}`;
    return step >= 1e-3 ? `${clock}:${second}${fraction}` : `:${second}${fraction}`;
  }

  // To the nanosecond.
  stamp(second, ns) {
    const shown = new Date(Number(this.local + BigInt(second)) * 1000).toISOString();
    return `${shown.slice(0, 10)} ${shown.slice(11, 19)}.${String(ns).padStart(9, "0")}`;
  }

  // Not finer than the span that is looked at makes sense of.
  text(time, span) {
    const digits = Math.min(9, Math.max(0, Math.ceil(3 - Math.log10(Math.max(span, 1e-9)))));
    const { date, clock, second, ns } = this.parts(time);
    const fraction = digits === 0 ? "" : `.${String(ns).padStart(9, "0").slice(0, digits)}`;
    return `${date} ${clock}:${second}${fraction}`;
  }

  parts(time) {
    let whole = Math.floor(time);
    let ns = Math.round((time - whole) * 1e9);
    if (ns >= 1e9) {
      whole += 1;
      ns -= 1e9;
    }
    const shown = new Date(Number(this.local + BigInt(whole)) * 1000).toISOString();
    return { date: shown.slice(0, 10), clock: shown.slice(11, 16), second: shown.slice(17, 19), ns };
  }
}
