// Makes report.html, which the program embeds, of page.html, page.css, page.js and uPlot.   npm ci && node build.mjs [--check]
import {createHash} from 'node:crypto';
import {readFileSync, writeFileSync} from 'node:fs';

const here = name => new URL(name, import.meta.url);
const read = name => readFileSync(here(name), 'utf8');
const library = 'node_modules/uplot/';
const licence = `/*! uPlot ${JSON.parse(read(library + 'package.json')).version}\n${read(library + 'LICENSE').trim()}\n*/\n`;
const style = read(library + 'dist/uPlot.min.css') + read('page.css');
const script = licence + read(library + 'dist/uPlot.iife.min.js') + '\n' + read('page.js');
if (/<\/(script|style)/i.test(script + style)) throw new Error('a script or style may not hold its own end');
const hash = text => `'sha256-${createHash('sha256').update(text).digest('base64')}'`;
const parts = {style, script, 'style-hash': hash(style), 'script-hash': hash(script)};
const page = read('page.html').replace(/{{([a-z-]+)}}/g, (_, name) => parts[name]);
if (process.argv.includes('--check')) {
  if (page !== read('report.html')) throw new Error('report.html is not what its sources make: run `node build.mjs`');
} else {
  writeFileSync(here('report.html'), page);
}
