// Opens reports in headless Chromium and uses them as a reader would.   node test.mjs QVTESTER FOLDER [screenshots]
// Makes its stores in FOLDER through `qvtester import`.
import assert from 'node:assert/strict';
import {execFileSync} from 'node:child_process';
import {statSync, writeFileSync} from 'node:fs';
import {resolve} from 'node:path';
import {chromium} from 'playwright-core';

const [program, folder, screenshots] = process.argv.slice(2).map((word, i) => i < 2 ? resolve(word) : word);
const kEvil = '<img src=x onerror="document.title=1">\u2028</script>&"\'';

// A run of a simulated camera, with figures, a curve and words of this number's own.
function run(i, count) {
  const mtf = 0.43 + 0.03 * Math.sin(i * 12.9898) - (i % 29 === 2 ? 0.1 : 0);
  const error = i % 101 === 7;
  const outcome = error ? 'ERROR' : mtf < 0.4 ? 'FAIL' : 'PASS';
  const figure = (name, value, more) => ({name, outcome: 'MEASURED', measured_value: value, units: {name: 'fraction of Nyquist', code: null, suffix: 'Nyquist'}, method: 'slanted edge', docstring: 'A figure. With words <b>of</b> its own.', ...more});
  const measurements = error ? {} : {
    autofocus_mtf50: figure('autofocus_mtf50', mtf, {outcome, limits: {min: 0.4, marginal_min: 0.41}, uncertainty: {standard: 0.004, expanded: 0.008, coverage_factor: 2, method: 'rows'}}),
    autofocus_odd: i % 5 ? figure('autofocus_odd', 1 + i / count) : figure('autofocus_odd', null, {non_finite: 'nan'}),
    autofocus_sfr: figure('autofocus_sfr', Array.from({length: 65}, (_, k) => [k / 64, Math.exp(-Math.LN2 * (k / 64 / mtf) ** 1.4)]), {dimensions: [{name: 'frequency', code: null, suffix: 'Nyquist', description: ''}]})};
  const start = 1795000000000 + i * 41000;
  const name = i === 1 ? kEvil : 'SN' + String(i).padStart(5, '0');
  const record = {schema: 'qvtester-record-1', dut_id: name, station_id: 'line' + (1 + i % 3), start_time_millis: start, end_time_millis: start + 40, outcome,
    outcome_details: error ? [{code: -91, description: '2 of 3 finder marks found in ' + name}] : [], marginal: false,
    metadata: {test_name: 'T', test_index: 14, library_version: '1', limits: {name: 'phone-a', revision: '3'}, properties: {}},
    phases: [{name: 'camera_autofocus', outcome, result_code: error ? -91 : 1, marginal: false, start_time_millis: start, end_time_millis: start + 40, measurements, attachments: {}}],
    inputs: [{slot: 17, path: name + '.jpg', sha256: i.toString(16).padStart(64, '0'), width: 4000, height: 3000}],
    log_records: [{level: 'DEBUG', logger_name: 'QVTEST', timestamp_millis: start, message: 'log of ' + name}]};
  const dot = 'iVBORw0KGgoAAAANSUhEUgAAAAEAAAABCAYAAAAfFcSJAAAADUlEQVR42mNk+M9QDwADhgGAWjR9awAAAABJRU5ErkJggg==';
  return JSON.stringify({schema: 'qvtester-run-1', key: 'k' + i, operator: '', lot: 'L' + i % 2, plan: '', step: '', columns: {rig: String(i % 4)}, record,
    pictures: i === 1 ? [{name: 'annotated.png', mimetype: 'image/png', content: dot}] : []});
}
function report(count) {
  const archive = `${folder}/${count}.jsonl`, page = `${folder}/${count}.html`;
  writeFileSync(archive, Array.from({length: count}, (_, i) => run(i, count)).join('\n') + '\n');
  execFileSync(program, ['import', archive, '-o', `${folder}/${count}.db`]);
  execFileSync(program, ['report', `${folder}/${count}.db`, '-o', page], {stdio: 'ignore'});
  return page;
}

const browser = await chromium.launch({executablePath: process.env.CHROMIUM || '/usr/bin/chromium', args: ['--no-sandbox']});
async function open(file, scheme = 'light') {
  const context = await browser.newContext({viewport: {width: 1280, height: 900}, colorScheme: scheme});
  const page = await context.newPage();
  page.said = [];
  page.on('console', message => page.said.push(message.text()));
  page.on('pageerror', error => page.said.push(String(error)));
  page.on('request', request => { if (!/^(file|data|blob):/.test(request.url())) page.said.push('asked for ' + request.url()); });
  const began = performance.now();
  await page.goto('file://' + file);
  await page.waitForSelector('html[data-ready=yes]', {timeout: 20000});
  await page.evaluate(() => new Promise(done => requestAnimationFrame(() => requestAnimationFrame(done))));
  page.took = performance.now() - began;
  return page;
}
const text = (page, selector) => page.locator(selector).innerText();

async function everySize(count) {
  const file = report(count);
  for (const scheme of ['light', 'dark']) {
    const page = await open(file, scheme);
    assert.deepEqual(page.said, []);
    assert.equal(await text(page, '#count'), `${count} of ${count} runs`);
    if (screenshots) await page.screenshot({path: `${folder}/${count}-${scheme}.png`, fullPage: true});
    if (scheme === 'light') console.log(`${count} runs: ${(statSync(file).size / 1e6).toFixed(1)} MB, shown after ${(page.took / 1000).toFixed(2)} s`);
    await page.context().close();
  }
  assert.ok(statSync(file).size < 15e6);
  return file;
}

async function usedByAReader(file) {
  const page = await open(file);
  // Verdicts counted here and on the page.
  const words = Array.from({length: 300}, (_, i) => JSON.parse(run(i, 300)).record.outcome);
  const passed = words.filter(w => w === 'PASS').length;
  assert.equal(await text(page, '#yield'), (100 * passed / 300).toFixed(1) + ' %');
  // Filters.
  await page.selectOption('#filter-outcome', '=FAIL');
  assert.equal(await text(page, '#count'), `${words.filter(w => w === 'FAIL').length} of 300 runs`);
  assert.equal(await page.locator('#runs tbody .v').allInnerTexts().then(all => new Set(all).size), 1);
  await page.getByRole('button', {name: 'Show all'}).click();
  await page.selectOption('#filter-rig', '=2');
  assert.equal(await text(page, '#count'), '75 of 300 runs');
  await page.getByRole('button', {name: 'Show all'}).click();
  await page.fill('#filter-unit', 'sn0004');
  assert.equal(await text(page, '#count'), '10 of 300 runs');
  await page.fill('#filter-unit', '');
  // Sorting, by the keyboard.
  await page.locator('[data-sort=unit]').focus();
  await page.keyboard.press('Enter');
  await page.keyboard.press('Enter');
  assert.equal(await text(page, '#runs tbody tr:first-child td:nth-child(2)'), 'SN00299');
  assert.equal(await page.locator('#runs th[aria-sort=descending]').innerText(), 'unit ▾');
  // The unit that is clicked, whose serial and file hold HTML: text, not elements.
  await page.fill('#filter-unit', '<img');
  await page.locator('[data-run="1"]').click();
  const pane = await text(page, '#pane');
  for (const part of [kEvil.replace('\u2028', ''), 'autofocus_mtf50', '±', 'at least 0.4']) assert.ok(pane.replace('\u2028', '').includes(part), part + ' in ' + pane);
  assert.equal(await page.locator('#pane img').count(), 1);
  assert.ok((await page.locator('#pane img').evaluate(img => img.naturalWidth)) > 0);
  assert.equal(await page.locator('img[onerror], #pane b, td b').count(), 0);
  assert.ok((await text(page, '#curves')).includes('<img'));
  await page.keyboard.press('Escape');
  assert.equal(await text(page, '#pane'), '');
  assert.equal(await page.title(), '300.db');
  // The policy holds against what a script might try.
  const refused = await page.evaluate(async () => {
    const tried = await Promise.allSettled([fetch('https://example.invalid/'), new Promise((yes, no) => { const s = document.createElement('script'); s.textContent = 'window.ran = 1'; document.body.append(s); window.ran ? yes() : no(); })]);
    return tried.map(t => t.status);
  });
  assert.deepEqual(refused, ['rejected', 'rejected']);
  await page.emulateMedia({media: 'print'});
  assert.equal(await page.locator('.filters').isVisible(), false);
  // A dark screen prints dark ink on white paper, plots too.
  await page.emulateMedia({media: 'screen', colorScheme: 'dark'});
  await page.evaluate(() => dispatchEvent(new Event('beforeprint')));
  const ink = await page.evaluate(() => {
    const canvas = document.querySelector('canvas'), pixels = canvas.getContext('2d').getImageData(0, 0, canvas.width, canvas.height).data;
    let dark = 0;
    for (let i = 0; i < pixels.length; i += 4) if (pixels[i + 3] > 250 && pixels[i] + pixels[i + 1] + pixels[i + 2] < 150) ++dark;
    return dark;
  });
  assert.ok(ink > 200, ink + ' dark pixels');
  await page.context().close();
}

try {
  await everySize(3);
  await usedByAReader(await everySize(300));
  await everySize(10000);
  console.log('the report works');
} finally {
  await browser.close();
}
