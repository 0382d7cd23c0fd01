// Shared by the browser tests: runs the styles program and opens its pages in
// Debian's Chromium through playwright-core, watching for console errors and
// for any request beyond the page's own file.
import { execFileSync } from 'node:child_process';
import fs from 'node:fs';
import path from 'node:path';
import { pathToFileURL } from 'node:url';
import { chromium } from 'playwright-core';

export const program = process.env.STYLES_PROGRAM;
export const sample = process.env.STYLES_SAMPLE;
export const output = process.env.STYLES_BROWSER_OUTPUT;
if (!program || !sample || !output)
  throw new Error('run through CTest: STYLES_PROGRAM, STYLES_SAMPLE and STYLES_BROWSER_OUTPUT are unset');
fs.mkdirSync(output, { recursive: true });

export function styles(...args) {
  return execFileSync(program, args, { encoding: 'utf8', maxBuffer: 1 << 28 });
}

// Writes `document` as JSON and its report (with `against`, if given) beside it.
export function report(name, document, against) {
  const source = path.join(output, name + '.json');
  fs.writeFileSync(source, JSON.stringify(document, null, 1));
  const page = path.join(output, name + '.html');
  styles('report', source, '-o', page, ...(against ? ['--against', against] : []));
  return { source, page };
}

export async function withBrowser(body) {
  const profile = fs.mkdtempSync(path.join(output, 'profile-'));
  const context = await chromium.launchPersistentContext(profile, {
    executablePath: '/usr/bin/chromium',
    headless: true,
    viewport: { width: 1440, height: 900 },
    args: ['--headless', '--no-sandbox', '--disable-gpu', '--disable-quic', '--no-first-run',
           '--disable-background-networking', '--disable-component-update', '--disable-sync'],
  });
  try {
    await body(context);
  } finally {
    await context.close();
    fs.rmSync(profile, { recursive: true, force: true });
  }
}

// Opens `file`; `problems` collects console errors, page errors and requests
// for anything but the file itself.
export async function open(context, file) {
  const url = pathToFileURL(file).href;
  const page = await context.newPage();
  const problems = [];
  page.on('console', message => {
    if (message.type() === 'error') problems.push('console: ' + message.text());
  });
  page.on('pageerror', error => problems.push('page error: ' + error.message));
  page.on('request', request => {
    if (request.url() !== url) problems.push('request: ' + request.url());
  });
  await page.goto(url);
  await page.waitForFunction(() => window.reportReady !== undefined);
  return { page, problems };
}

// The rows of the values table: [path, value, source] each.
export function valueRows(page) {
  return page.$$eval('#values tbody tr', rows => rows.map(row =>
      ['.path', '.value', '.source'].map(cell => row.querySelector(cell).textContent)));
}
