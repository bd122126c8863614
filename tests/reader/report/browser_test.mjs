// Opens pages of `qntrace report` in a browser and uses them as people do.
//
//   node browser_test.mjs QNTRACE SAMPLE PACKAGES CHROMIUM PICTURES
//
// SAMPLE writes the traces, PACKAGES holds node_modules, PICTURES is the folder for pictures of the page.
import assert from "node:assert/strict";
import { execFileSync, spawnSync } from "node:child_process";
import { mkdtempSync, rmSync } from "node:fs";
import { createRequire } from "node:module";
import { tmpdir } from "node:os";
import { join } from "node:path";
import { after, before, test } from "node:test";

const [qntrace, sample, packages, browserProgram, pictures] = process.argv.slice(2);
const { chromium } = createRequire(join(packages, "package.json"))("playwright-core");

const folder = mkdtempSync(join(tmpdir(), "qntrace-browser-"));
const traces = join(folder, "spool");
const flags = [
  "--headless", "--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run",
  "--disable-background-networking", "--disable-component-update", "--disable-sync",
];
let browser;

// A page with everything that it says and asks for on its way.
async function open(name) {
  const page = await browser.newPage();
  const heard = { messages: [], errors: [], requests: [] };
  page.on("console", (message) => heard.messages.push(message.text()));
  page.on("pageerror", (error) => heard.errors.push(error.message));
  page.on("request", (request) => heard.requests.push(request.url()));
  await page.goto(`file://${join(folder, name)}`);
  await page.waitForSelector("#details p, .empty");
  return { page, heard };
}

async function withPage(name, use) {
  const { page, heard } = await open(name);
  try {
    await use(page, heard);
    assert.deepEqual(heard, { messages: [], errors: [], requests: [`file://${join(folder, name)}`] });
  } finally {
    await page.close();
  }
}

// How many colours a canvas shows.
const colorsOf = (page, selector) =>
  page.locator(selector).evaluate((canvas) => {
    const { data } = canvas.getContext("2d").getImageData(0, 0, canvas.width, canvas.height);
    return new Set(new Uint32Array(data.buffer)).size;
  });

// For those who only look: one page for all of them, opened once.
let shared;
const lookAt = (look) => async () => {
  shared ??= await open("page.html");
  await look(shared.page);
  assert.deepEqual(shared.heard, { messages: [], errors: [], requests: [`file://${join(folder, "page.html")}`] });
};

const picturesOf = (page) =>
  page.evaluate(() => [...document.querySelectorAll("canvas")].map((canvas) => canvas.toDataURL()));

// What is drawn is drawn in the next frame.
async function afterDrawing(page) {
  await page.evaluate(() => new Promise((done) => requestAnimationFrame(() => requestAnimationFrame(done))));
}

async function changesBothCharts(page, act) {
  const before = await picturesOf(page);
  await act();
  await afterDrawing(page);
  const now = await picturesOf(page);
  assert.equal(now.length, 2);
  assert.notEqual(now[0], before[0], "the rates are as they were");
  assert.notEqual(now[1], before[1], "the timeline is as it was");
}

const rangeOf = (page) => page.locator("#range").textContent();

// A point of the timeline, right of the names of its rows.
async function timelinePoint(page, share) {
  const box = await page.locator("#timeline canvas").boundingBox();
  return { x: box.x + 240 + (box.width - 250) * share, y: box.y + 75 };
}

before(async () => {
  execFileSync(sample, [traces, "8000"]);
  // Damage is told on standard error; the page is made all the same.
  assert.equal(spawnSync(qntrace, ["report", "--utc", "-o", join(folder, "page.html"), traces]).status, 1);
  const none = ["report", "--utc", "--comp", "NONE", "-o", join(folder, "empty.html"), traces];
  assert.equal(spawnSync(qntrace, none).status, 1);
  browser = await chromium.launchPersistentContext(join(folder, "profile"), {
    executablePath: browserProgram,
    args: flags,
    viewport: { width: 1400, height: 1000 },
  });
});

after(async () => {
  await browser?.close();
  rmSync(folder, { recursive: true, force: true });
});

test("the charts are drawn",
  lookAt(async (page) => {
    assert.ok((await colorsOf(page, "#rates canvas")) > 10);
    assert.ok((await colorsOf(page, "#timeline canvas")) > 10);
  }));

test("the table has the rows of qntrace errors",
  lookAt(async (page) => {
    const { stdout } = spawnSync(qntrace, ["errors", "--json", "--utc", traces], { encoding: "utf8" });
    const groups = stdout.trim().split("\n").map((line) => JSON.parse(line)).filter(({ type }) => type === "group");
    assert.equal(groups.length, 2);
    const wanted = groups.map(({ errors, latest, nodes }) => [
      String(errors),
      latest.message,
      latest.comp,
      nodes.map(({ node, errors: count }) => `${node} ${count}`).join(", "),
      latest.program,
    ]);
    const rows = await page.locator("#errors tbody tr").evaluateAll((all) =>
      all.map(({ cells: [count, message, component, nodes, program] }) => [
        count.textContent,
        message.firstElementChild.textContent,
        component.textContent,
        [...nodes.children].map((node) => node.textContent).join(", "),
        program.textContent,
      ]));
    assert.deepEqual(rows, wanted);
  }));

test("a head of the table sorts it", () =>
  withPage("page.html", async (page) => {
    const counts = () => page.locator("#errors tbody td:first-child").allTextContents();
    const before = await counts();
    await page.getByRole("button", { name: "Count" }).click();
    assert.deepEqual(await counts(), [...before].reverse());
    assert.equal(await page.locator("#errors th").first().getAttribute("aria-sort"), "ascending");
  }));

test("texts out of traces stay texts",
  lookAt(async (page) => {
    assert.equal(await page.title(), "Trace report");
    assert.equal(await page.locator("img, b, iframe").count(), 0);
    assert.equal(await page.locator("script").count(), 2);
    assert.ok((await page.locator("#errors").textContent()).includes(`<img src=x onerror="document.title='taken'">`));
    assert.equal(await page.locator(".chip-name", { hasText: "<b>" }).count(), 1);
  }));

test("the policy stops a script that is not the page's own", async () => {
  const { page, heard } = await open("page.html");
  await page.evaluate(() => {
    const script = document.createElement("script");
    script.textContent = "document.title = 'taken'";
    document.body.append(script);
  });
  assert.equal(await page.title(), "Trace report");
  assert.equal(heard.messages.length, 1);
  await page.close();
});

test("the wheel zooms both charts, and a button shows all again", () =>
  withPage("page.html", async (page) => {
    const all = await rangeOf(page);
    const point = await timelinePoint(page, 0.5);
    await page.mouse.move(point.x, point.y);
    await changesBothCharts(page, () => page.mouse.wheel(0, -300));
    assert.notEqual(await rangeOf(page), all);
    await changesBothCharts(page, () => page.locator("#reset").click());
    assert.equal(await rangeOf(page), all);
  }));

for (const [name, selector] of [["rates", "#rates .u-over"], ["timeline", "#timeline canvas"]]) {
  test(`dragging over the ${name} zooms both charts`, () =>
    withPage("page.html", async (page) => {
      const all = await rangeOf(page);
      const box = await page.locator(selector).boundingBox();
      await changesBothCharts(page, async () => {
        await page.mouse.move(box.x + box.width * 0.5, box.y + 60);
        await page.mouse.down();
        await page.mouse.move(box.x + box.width * 0.6, box.y + 60, { steps: 4 });
        await page.mouse.up();
      });
      assert.notEqual(await rangeOf(page), all);
    }));
}

test("keys go to errors and records and zoom", () =>
  withPage("page.html", async (page) => {
    await page.focus(".timeline-scroll");
    await page.keyboard.press("e");
    assert.match(await page.locator("#details pre.is-error").textContent(), /error=/);
    const first = await page.locator("#details").textContent();
    await page.keyboard.press("ArrowRight");
    assert.notEqual(await page.locator("#details").textContent(), first);
    await changesBothCharts(page, () => page.keyboard.press("+"));
    await changesBothCharts(page, () => page.keyboard.press("0"));
  }));

test("the last error of a group leads to its record", () =>
  withPage("page.html", async (page) => {
    const message = await page.locator("#errors .message div").first().textContent();
    await page.locator("#errors .link").first().click();
    const details = await page.locator("#details pre.is-error").textContent();
    assert.ok(details.replaceAll('\\"', '"').includes(message), details);
  }));

test("the legend takes components out of both charts", () =>
  withPage("page.html", async (page) => {
    const chip = page.locator(".chip").first();
    await changesBothCharts(page, () => chip.click());
    assert.equal(await chip.getAttribute("aria-pressed"), "false");
  }));

test("the pointer is told what is under it",
  lookAt(async (page) => {
    const box = await page.locator("#rates .u-over").boundingBox();
    await page.mouse.move(box.x + box.width * 0.3, box.y + 100);
    assert.match(await page.locator("#tooltip").textContent(), /IDX.*\/s/);
  }));

test("a page without records says so", () =>
  withPage("empty.html", async (page) => {
    assert.deepEqual(await page.locator(".empty").allTextContents(), [
      "No records with a time.",
      "No records with a time.",
      "No error records.",
    ]);
  }));

for (const [scheme, width] of [["light", 1400], ["dark", 1400], ["light", 420]]) {
  test(`nothing is wider than a ${scheme} page of ${width} pixels`,
    lookAt(async (page) => {
      await page.emulateMedia({ colorScheme: scheme });
      await page.setViewportSize({ width, height: 900 });
      await afterDrawing(page);
      assert.ok(await page.evaluate(() => document.documentElement.scrollWidth <= innerWidth));
      await page.screenshot({ path: join(pictures, `report-${scheme}-${width}.png`), fullPage: true });
    }));
}
