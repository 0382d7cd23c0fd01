// The report of the sample sheet in a real browser: values and sources agree
// with `styles show --explain`, search ignores letter case, and a report made
// against an older sheet marks what changed.
import assert from 'node:assert/strict';
import fs from 'node:fs';
import path from 'node:path';
import { test } from 'node:test';
import { open, output, report, sample, styles, valueRows, withBrowser } from './browser.mjs';

// `styles show --explain` as rows of [path, value, source].
function explained(name) {
  return styles('show', sample, name, '--explain').split('\n').slice(1)
      .filter(line => line.trim()).map(line => line.trim().split(/ {2,}/));
}

test('the sample sheet report shows what the command explains', async () => {
  const page = path.join(output, 'sample.html');
  styles('report', sample, '-o', page);
  await withBrowser(async context => {
    const { page: tab, problems } = await open(context, page);
    for (const name of ['Heading 1', 'Quote']) {
      await tab.click(`g.node[data-name="${name}"]`);
      assert.equal(await tab.textContent('#details h2'), name);
      assert.deepEqual(await valueRows(tab), explained(name));
    }
    // Own values are marked, and only they.
    const marks = await tab.$$eval('#values tbody tr', rows => rows.map(row =>
        [row.classList.contains('own'), row.querySelector('.mark').textContent !== '']));
    const own = explained('Quote').map(row => row[2] === 'own');
    assert.deepEqual(marks, own.map(flag => [flag, flag]));

    await tab.fill('#search', 'hEADING 1');
    assert.equal(await tab.textContent('#results li:first-child'), 'Heading 1Paragraph');
    await tab.fill('#search', 'überschrift');
    await tab.press('#search', 'Enter');
    assert.equal(await tab.textContent('#details h2'), 'Überschrift 4');
    assert.equal(await tab.getAttribute('g.node.selected', 'data-name'), 'Überschrift 4');

    await tab.click('g.node[data-name="Heading 1"]');
    await tab.screenshot({ path: path.join(output, 'report.png') });
    assert.deepEqual(problems, []);
  });
});

test('a report against an older sheet marks added, removed and changed styles', async () => {
  const document = JSON.parse(fs.readFileSync(sample, 'utf8'));
  const paragraphs = document.paragraph;
  paragraphs['Heading 1'].spaceBefore = '30';
  paragraphs['Heading 1'].character.fontSize = '22';
  delete paragraphs['Footnote Text'];
  paragraphs['Heading 4'] = { inherits: 'Heading 3', spaceBefore: '10' };
  const { page } = report('changed', document, sample);
  await withBrowser(async context => {
    const { page: tab, problems } = await open(context, page);
    const status = name => tab.getAttribute(`g.node[data-name="${name}"]`, 'class');
    assert.match(await status('Heading 1'), /\bchanged\b/);
    assert.match(await status('Heading 4'), /\badded\b/);
    // Chapter Title sets neither value but inherits the new font size.
    assert.match(await status('Chapter Title'), /\beffective\b/);
    assert.match(await status('Heading 2'), /^node\s+$/);
    assert.match(await tab.textContent('#removed'), /Footnote Text/);

    await tab.click('g.node[data-name="Heading 1"]');
    const changes = await tab.$$eval('#values tbody tr.changed', rows => rows.map(row =>
        [row.querySelector('.path').textContent, row.querySelector('.change').textContent]));
    assert.deepEqual(changes, [['spaceBefore', '24 → 30'], ['character.fontSize', '20 → 22']]);
    await tab.click('g.node[data-name="Chapter Title"]');
    const inherited = await tab.$$eval('#values tbody tr.effective .path', cells =>
        cells.map(cell => cell.textContent));
    assert.deepEqual(inherited, ['character.fontSize']);
    assert.deepEqual(problems, []);
  });
});
