// Shows a profile to speedscope in a browser without a window, and fails when it does not show every event of it.
//
// usage: node load.mjs SPEEDSCOPE-FOLDER PROFILE BROWSER USER-DATA-FOLDER
import assert from 'node:assert/strict';
import {createServer} from 'node:http';
import {readFile} from 'node:fs/promises';
import {extname, join, normalize} from 'node:path';
import {chromium} from 'playwright-core';

const [viewer, profile, browser, userData] = process.argv.slice(2);
const types = {'.html': 'text/html', '.js': 'text/javascript', '.css': 'text/css', '.json': 'application/json'};
const patience = {timeout: 60_000};

const events = JSON.parse(await readFile(profile, 'utf8')).traceEvents.filter(event => event.ph === 'X');
const threads = [...new Set(events.map(event => event.tid))];

// What the viewer calls the events of a thread.
const namesOf = thread =>
    new Set(events.filter(event => event.tid === thread).map(event => `${event.name} ${JSON.stringify(event.args)}`));

const server = createServer(async (request, response) => {
    const path = new URL(request.url, 'http://localhost').pathname;
    const file = path === '/profile.json' ? profile : join(viewer, normalize(path));
    try {
        const data = await readFile(file);
        response.writeHead(200, {'Content-Type': types[extname(file)] ?? 'application/octet-stream'});
        response.end(data);
    } catch {
        response.writeHead(404).end();
    }
});
await new Promise(done => server.listen(0, '127.0.0.1', done));
const base = `http://127.0.0.1:${server.address().port}`;

const context = await chromium.launchPersistentContext(userData, {
    executablePath: browser,
    headless: true,
    viewport: {width: 1280, height: 20_000}, // so that all rows of the table are there
    args: ['--headless', '--no-sandbox', '--disable-gpu', '--disable-quic', '--no-first-run',
           '--disable-background-networking', '--disable-component-update', '--disable-sync'],
});
try {
    const page = await context.newPage();
    const problems = [];
    page.on('pageerror', error => problems.push(String(error)));
    await page.goto(`${base}/index.html#profileURL=${encodeURIComponent(`${base}/profile.json`)}`);
    await page.getByText('Sandwich').click(patience);
    const rows = page.locator('table tr:visible').filter({has: page.locator('td')});
    for (let i = 0; i < threads.length; ++i) {
        const heading = page.getByText(new RegExp(`\\(tid \\d+\\).*\\(${i + 1}/${threads.length}\\)`)).first();
        await heading.waitFor(patience);
        const thread = Number((await heading.innerText()).match(/\(tid (\d+)\)/)[1]);
        await rows.first().waitFor(patience);
        const shown = (await rows.allInnerTexts()).map(row => row.split('\n').map(cell => cell.trim()));
        assert.deepEqual(new Set(shown.map(cells => cells.at(-1))), namesOf(thread));
        // No event is taken for a part of another one.
        for (const [total, self] of shown) assert.equal(total, self);
        console.log(`thread ${thread}: ${shown.length} events`);
        await page.keyboard.press('n'); // the next thread
    }
    assert.deepEqual(problems, []);
} finally {
    await context.close();
    server.close();
}
