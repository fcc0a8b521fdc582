// The live page in a real browser: `maroset serve` on a project whose PLC is the soft-PLC
// simulator, Debian's chromium headless. A value moved by the device reaches the page without
// a reload, and a value typed into the page's write box reaches the device and comes back
// once the page has the service's token.
//
//   node page.test.mjs MAROSET   (CHROMIUM overrides /usr/bin/chromium)
import { spawn, execFileSync } from 'node:child_process';
import { mkdtempSync, rmSync } from 'node:fs';
import { tmpdir } from 'node:os';
import { join } from 'node:path';
import { chromium } from 'playwright-core';

const maroset = process.argv[2];
const browserPath = process.env.CHROMIUM || '/usr/bin/chromium';
const dir = mkdtempSync(join(tmpdir(), 'maroset-page-'));
const children = [];
let browser = null;

// Everything below has its own bound; this one ends a run that hangs anyway.
const watchdog = setTimeout(() => fail(new Error('the test took more than 150 s')), 150000);

function fail(error) {
  console.error('FAIL:', error.message);
  for (const child of children) child.kill('SIGKILL');
  process.exit(1);
}

// A child whose standard output is kept, so the test can wait for a line in it.
function start(args) {
  const child = spawn(maroset, args, { stdio: ['pipe', 'pipe', 'inherit'] });
  child.output = '';
  child.stdout.on('data', (chunk) => { child.output += chunk; });
  children.push(child);
  return child;
}

async function waitForOutput(child, pattern, what, ms = 20000) {
  const until = Date.now() + ms;
  for (;;) {
    const match = child.output.match(pattern);
    if (match) return match;
    if (child.exitCode !== null) throw new Error(`${what}: the process ended (${child.exitCode})`);
    if (Date.now() > until) throw new Error(`${what}: not seen in ${ms} ms; output:\n${child.output}`);
    await new Promise((resolve) => setTimeout(resolve, 50));
  }
}

function project(...args) {
  execFileSync(maroset, ['project', ...args], { stdio: ['ignore', 'ignore', 'inherit'] });
}

async function stop(child, what) {
  const ended = new Promise((resolve) => child.once('exit', (code) => resolve(code)));
  child.kill('SIGTERM');
  const code = await Promise.race([ended, new Promise((r) => setTimeout(() => r('timeout'), 10000))]);
  if (code !== 0) throw new Error(`${what} did not stop cleanly on SIGTERM: ${code}`);
}

async function main() {
  // The device: values move every 300 ms; a written text holds.
  const plc = start(['sim', 'softplc', '--port', '0', '--step', '300']);
  const [, port] = await waitForOutput(plc, /on 127\.0\.0\.1:(\d+)/, 'the simulator\'s port');

  const db = join(dir, 'plant.db');
  project('init', db);
  project('add', db, 'PLC1', 'NUVTCPIP', '--ip-address', '127.0.0.1', '--port', port,
          '--update-rate', '1000');
  project('add', db, 'Mem', 'MEMTAG');
  project('tag', 'add', db, 'PLC1', '1', 'Counter');
  project('tag', 'add', db, 'PLC1', '2', 'Label', '--name', 'Batch label');
  project('tag', 'add', db, 'Mem', '1', 'Setpoint');

  const token = 'page-test-token';
  const serve = start(['serve', db, '--http', '127.0.0.1:0', '--allow-writes', '--token', token,
                       '--drive-root', join(dir, 'drive_c')]);
  const [, url] = await waitForOutput(serve, /listening on (http:\/\/127\.0\.0\.1:\d+\/)/,
                                      'the service\'s address');

  browser = await chromium.launch({ executablePath: browserPath, args: ['--no-sandbox'],
                                    timeout: 30000 });
  const page = await browser.newPage();
  page.setDefaultTimeout(20000);
  const pageErrors = [];
  page.on('pageerror', (e) => pageErrors.push(e.message));
  await page.goto(url);
  await page.evaluate(() => { window.sameDocument = true; });

  console.log('page loaded:', url);
  // Every node, showing the link state the service has for it.
  await page.waitForFunction(async () => {
    const nodes = await (await fetch('/api/nodes')).json();
    return nodes.length === 2 && nodes.every((n) => document.querySelector(
        `#nodes [data-node="${n.name}"][data-link="${n.link.state}"]`));
  });
  if (await page.locator('#nodes [data-node="Mem"]').getAttribute('data-link') !== 'local')
    throw new Error('the memory tag node is not shown as local');

  console.log('nodes shown with their link states');
  // A change the device makes arrives in the value cell on its own.
  const counter = page.locator('[data-node="PLC1"][data-handle="1"] [data-role="value"]');
  await page.waitForFunction((cell) => /^\d+$/.test(cell.textContent), await counter.elementHandle());
  const first = await counter.textContent();
  await page.waitForFunction(([cell, before]) => cell.textContent !== before,
                             [await counter.elementHandle(), first]);
  if (!(await page.evaluate(() => window.sameDocument))) throw new Error('the page reloaded');

  console.log(`value change arrived: ${first} -> ${await counter.textContent()}`);
  // A write from the page's box reaches the device, which sends the value back; the first
  // try has no token, is refused, and brings up the token field.
  const written = 'lot' + (Date.now() % 100000);
  const label = page.locator('[data-node="PLC1"][data-handle="2"]');
  await label.locator('input').fill(written);
  await label.locator('button').click();
  await page.locator('#token input').waitFor();
  await page.waitForFunction(() => document.querySelector('#write-status.failed'));
  await page.locator('#token input').fill(token);
  await label.locator('button').click();
  await page.waitForFunction(([cell, value]) => cell.textContent === value,
                             [await label.locator('[data-role="value"]').elementHandle(), written]);
  console.log('written value came back:', written);
  plc.stdin.write('values\n');
  await waitForOutput(plc, new RegExp(`^2 .* = ${written}$`, 'm'), 'the written value in the device');
  if (!/written/.test(await page.locator('#write-status').textContent()))
    throw new Error('the page does not say the write succeeded');

  // The trend draws the counter's changes.
  await page.locator('[data-node="PLC1"][data-handle="1"]').click();
  await page.waitForFunction(() => document.getElementById('trend-line')
                                       .getAttribute('points').split(' ').length > 2);

  if (pageErrors.length) throw new Error('errors in the page: ' + pageErrors.join('; '));
  await browser.close();
  browser = null;
  await stop(serve, 'maroset serve');
  await stop(plc, 'the simulator');
}

main()
  .then(() => {
    clearTimeout(watchdog);
    rmSync(dir, { recursive: true, force: true });
    console.log('browser test passed');
  })
  .catch(async (error) => {
    if (browser) await browser.close().catch(() => {});
    fail(error);
  });
