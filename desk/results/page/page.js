'use strict';
/* The report's page: shows the data it holds. Every word of the data reaches the page as text, never as HTML. */
(() => {
const PAGE = 100;       // rows of the list of runs at a time
const MOST_CURVES = 300; // drawn one by one; above, bands
const SHARES = [0.05, 0.25, 0.5, 0.75, 0.95];
const SHAPES = { // a verdict is a word and a shape
  PASS: 'M5 0a5 5 0 1 0 .01 0z', FAIL: 'M0 1.5L1.5 0 5 3.5 8.5 0 10 1.5 6.5 5 10 8.5 8.5 10 5 6.5 1.5 10 0 8.5 3.5 5z',
  ERROR: 'M5 0L10 10H0z', ABORTED: 'M0 0H10V10H0z', UNSET: 'M5 0L10 5 5 10 0 5z',
  MEASURED: 'M5 0a5 5 0 1 0 .01 0zM5 2.5a2.5 2.5 0 1 1-.01 0z'};
const RANK = {MEASURED: 0, PASS: 1, FAIL: 2, ABORTED: 3, ERROR: 4};

let D, N;               // the data; how many runs
const state = {text: '', chosen: {}, sort: ['start', -1], page: 0, figure: 0, run: -1};
let shown = [];         // runs that the filters let through, in the list's order
let plots = [];         // those on the page, to be drawn anew when colours or widths change
const $ = id => document.getElementById(id);

function h(tag, attributes, ...children) {
  const element = document.createElement(tag);
  for (const [name, value] of Object.entries(attributes || {})) {
    if (value === undefined || value === false) continue;
    if (name.startsWith('on')) element.addEventListener(name.slice(2), value);
    else element.setAttribute(name, value === true ? '' : value);
  }
  element.append(...children.flat().filter(c => c !== null && c !== undefined));
  return element;
}
/* Long names go on behind an underscore. */
const broken_up = name => name.split(/(?<=_)/).flatMap((part, i) => i ? [h('wbr'), part] : [part]);
function verdict(word, marginal) {
  const ns = 'http://www.w3.org/2000/svg';
  const svg = document.createElementNS(ns, 'svg'), path = document.createElementNS(ns, 'path');
  svg.setAttribute('viewBox', '0 0 10 10'); svg.setAttribute('aria-hidden', 'true');
  path.setAttribute('d', SHAPES[word] || SHAPES.UNSET); path.setAttribute('fill-rule', 'evenodd'); path.setAttribute('stroke', 'none');
  svg.append(path);
  const known = word in SHAPES ? word : 'UNSET';
  return h('span', {class: 'v ' + known}, svg, word + (marginal ? ', marginal' : ''));
}
const value_of = (column, i) => column.values[column.index[i]];
const column_of = name => D[name] && D[name].index ? D[name] : D.columns[name];
const field = (name, i) => value_of(column_of(name), i);
const number = x => x === null || x === undefined ? '' : typeof x === 'string' ? x : Math.abs(x) < 1e-3 && x !== 0 ? x.toExponential(3).replace(/\.?0*e/, 'e') : String(Number(x.toPrecision(6)));
const percent = x => isFinite(x) ? (100 * x).toFixed(1) + ' %' : '–';
const two = x => String(x).padStart(2, '0');
function time(ms) {
  const t = new Date(ms);
  return `${t.getFullYear()}-${two(t.getMonth() + 1)}-${two(t.getDate())} ${two(t.getHours())}:${two(t.getMinutes())}`;
}
const short_name = f => many_steps() ? f.step + ': ' + f.name : f.name;
const many_steps = () => D.step.values.length > 1;
const with_unit = (text, unit) => unit === '1' || !unit ? text : text + ' ' + unit;
function bounds_text(b) {
  if ('min' in b && 'max' in b) return number(b.min) + ' to ' + number(b.max);
  return 'min' in b ? 'at least ' + number(b.min) : 'max' in b ? 'at most ' + number(b.max) : '';
}
const limits_text = (f, k) => f.list_limits && f.list_limits[f.run[k]] || bounds_text(f.bounds[f.bound[k]]);
function reading(f, k) {
  if (f.list && f.list[f.run[k]]) return f.list[f.run[k]];
  if (f.value[k] === null) return 'not measured';
  const u = f.uncertainty[k];
  const text = number(f.value[k]) + (typeof u === 'number' ? ' ± ' + Number((2 * u).toPrecision(2)) : '');
  return with_unit(text, f.unit);
}
const finite = x => typeof x === 'number';

/* --- statistics --- */
function moments(values) {
  let n = 0, mean = 0, squares = 0, min = Infinity, max = -Infinity;
  for (const x of values) {
    const off = x - mean;
    mean += off / ++n; squares += off * (x - mean);
    if (x < min) min = x;
    if (x > max) max = x;
  }
  return {n, mean, s: n > 1 ? Math.sqrt(squares / (n - 1)) : NaN, min, max};
}
function cpk(m, b) {
  if (!(m.s > 0) || !('min' in b || 'max' in b)) return NaN;
  return Math.min('min' in b ? (m.mean - b.min) / (3 * m.s) : Infinity, 'max' in b ? (b.max - m.mean) / (3 * m.s) : Infinity);
}
function quantile(sorted, share) {
  const at = share * (sorted.length - 1), low = Math.floor(at), high = Math.min(low + 1, sorted.length - 1);
  return sorted[low] + (sorted[high] - sorted[low]) * (at - low);
}
/* Of each unit, the worst of its latest runs of each step. */
function unit_verdicts(runs) {
  const latest = new Map();
  for (const i of runs) {
    const key = D.unit[i] + '\n' + D.step.index[i] + '\n' + D.measurement.index[i];
    const before = latest.get(key);
    if (before === undefined || D.start_millis[i] >= D.start_millis[before]) latest.set(key, i);
  }
  const units = new Map();
  for (const i of latest.values()) {
    const word = field('outcome', i), had = units.get(D.unit[i]);
    if (had === undefined || (RANK[word] ?? 4) > (RANK[had] ?? 4)) units.set(D.unit[i], word);
  }
  return units;
}
function tally(words) {
  const counts = {};
  for (const word of words) counts[word] = (counts[word] || 0) + 1;
  return counts;
}
function yield_of(counts) {
  const judged = (counts.PASS || 0) + (counts.FAIL || 0) + (counts.ERROR || 0);
  return judged ? (counts.PASS || 0) / judged : NaN;
}

/* --- plots --- */
function colours() {
  const style = getComputedStyle(document.documentElement);
  return name => style.getPropertyValue('--' + name).trim();
}
/* Times as 24 hours, with the day where it changes and the year where there is room. */
function clock(p, splits, axis, space, step) {
  const days = splits.map(t => time(t * 1000).slice(0, 10));
  return splits.map((t, i) => {
    if (step >= 86400) return days[i];
    const moment = new Date(t * 1000), seconds = step < 60 ? ':' + two(moment.getSeconds()) + (step < 1 ? (moment.getMilliseconds() / 1000).toFixed(step < 0.1 ? 2 : 1).slice(1) : '') : '';
    const day = days[i] === days[i - 1] ? '' : '\n' + (i === 0 && days[1] === days[0] ? days[i] : days[i].slice(5));
    return time(t * 1000).slice(11) + seconds + day;
  });
}
/* Where an axis of time ends: a little beyond the first and the last, also when they are one. */
const around = pad => (u, from, to) => { const x = u.data[0]; return [from - pad, (x[0] === x[x.length - 1] ? from : to) + pad]; };
function axes(c, x_label, y_label, extra) {
  const grid = {stroke: c('line'), width: 1}, ticks = grid;
  return [{label: x_label, stroke: c('text'), grid, ticks, ...(extra || {}).x}, {label: y_label, stroke: c('text'), grid, ticks, size: 62, ...(extra || {}).y},
    ...((extra || {}).more || [])];
}
/* Zones and lines of limits, upright or level; or the words beside them, which go on top of what is drawn. */
function limit_marks(c, b, u, upright, words_only) {
  return plot => {
    const ctx = plot.ctx, box = plot.bbox;
    const scale = upright ? 'x' : 'y';
    const at = v => plot.valToPos(v, scale, true);
    const fill = (from, to, colour) => {
      const low = upright ? box.left : box.top, high = upright ? box.left + box.width : box.top + box.height;
      const a = Math.max(low, Math.min(from, to)), z = Math.min(high, Math.max(from, to));
      if (z <= a) return;
      ctx.fillStyle = colour;
      if (upright) ctx.fillRect(a, box.top, z - a, box.height); else ctx.fillRect(box.left, a, box.width, z - a);
    };
    const line = (v, words, dashes) => {
      const p = at(v);
      if (upright ? p < box.left || p > box.left + box.width : p < box.top || p > box.top + box.height) return;
      if (words_only) {
        const em = 12 * devicePixelRatio;
        ctx.font = em + 'px system-ui, sans-serif'; ctx.textAlign = 'left';
        const wide = ctx.measureText(words).width, x = upright ? Math.min(p + 4, box.left + box.width - wide) : box.left + 4, y = upright ? box.top + em : Math.max(p - 4, box.top + em);
        ctx.fillStyle = c('back'); ctx.fillRect(x - 2, y - em, wide + 4, 1.3 * em);
        ctx.fillStyle = c('text'); ctx.fillText(words, x, y);
        return;
      }
      ctx.strokeStyle = c('text'); ctx.lineWidth = 1.5 * devicePixelRatio; ctx.setLineDash(dashes.map(d => d * devicePixelRatio));
      ctx.beginPath();
      if (upright) { ctx.moveTo(p, box.top); ctx.lineTo(p, box.top + box.height); } else { ctx.moveTo(box.left, p); ctx.lineTo(box.left + box.width, p); }
      ctx.stroke(); ctx.setLineDash([]);
    };
    ctx.save();
    if (words_only) {
      for (const side of ['min', 'max']) if (side in b) line(b[side], side + ' ' + number(b[side]), []);
      ctx.restore();
      return;
    }
    const far = {min: at(-1e300), max: at(1e300)};
    for (const side of ['min', 'max']) {
      if (!(side in b)) continue;
      fill(far[side], at(b[side]), c('bad-zone'));
      if (u > 0) fill(at(b[side] - 2 * u), at(b[side] + 2 * u), c('guard'));
      line(b[side], '', []);
      const marginal = 'marginal_' + side;
      if (marginal in b) line(b[marginal], '', [4, 4]);
    }
    ctx.restore();
  };
}
function plot(host, make) {
  const one = {host, make, drawn: null};
  one.draw = () => {
    if (one.drawn) one.drawn.destroy();
    const {options, data} = make(colours());
    one.drawn = new uPlot({width: Math.max(280, host.clientWidth), height: 300, cursor: {drag: {x: true, y: true}}, ...options}, data, host);
  };
  plots.push(one);
  one.draw();
}
const plot_box = (title, note) => {
  const host = h('div', {class: 'canvas'});
  return [h('figure', {class: 'plot', style: undefined}, h('h3', {}, title), host, note ? h('p', {}, note) : null), host];
};

/* --- filters --- */
function apply() {
  const text = state.text.toLowerCase();
  const wanted = Object.entries(state.chosen).filter(([, word]) => word !== '');
  shown = [];
  for (let i = 0; i < N; ++i) {
    if (text && !D.unit[i].toLowerCase().includes(text)) continue;
    if (wanted.every(([name, word]) => field(name, i) === word.slice(1))) shown.push(i);
  }
  state.page = 0;
  sort_runs();
  render();
}
function sort_runs() {
  const [name, sign] = state.sort;
  const key = name === 'start' ? i => D.start_millis[i] : name === 'unit' ? i => D.unit[i] : name === 'failed' ? i => failed_figures(i).length
    : name === 'outcome' ? i => -(RANK[field('outcome', i)] ?? 4) : i => field(name, i);
  const keys = new Map(shown.map(i => [i, key(i)]));
  shown.sort((a, b) => {
    const x = keys.get(a), y = keys.get(b);
    const order = typeof x === 'number' ? x - y : x.localeCompare(y, undefined, {numeric: true});
    return sign * order || a - b;
  });
}
function select_of(name, label) {
  const column = column_of(name);
  const words = [...new Set(column.values)].sort((a, b) => a.localeCompare(b, undefined, {numeric: true}));
  if (words.length < 2 || words.length > 500) return null;
  const select = h('select', {id: 'filter-' + name, onchange: e => { state.chosen[name] = e.target.value; apply(); }},
    h('option', {value: ''}, 'all'), words.map(word => h('option', {value: '=' + word}, word || '(none)')));
  return h('label', {}, label, select);
}
function filters() {
  const box = h('form', {class: 'filters', 'aria-label': 'Filters', onsubmit: e => e.preventDefault()},
    h('label', {}, 'unit', h('input', {type: 'search', id: 'filter-unit', placeholder: 'part of a serial', oninput: e => { state.text = e.target.value; apply(); }})),
    select_of('outcome', 'verdict'), select_of('step', 'step'), select_of('station', 'station'), select_of('lot', 'lot'), select_of('operator', 'operator'),
    select_of('limits', 'limits'), Object.keys(D.columns).map(name => select_of(name, name)),
    h('button', {type: 'button', onclick: () => { state.text = ''; state.chosen = {}; box.reset(); apply(); }}, 'Show all'));
  return box;
}

/* --- sections --- */
function summary() {
  const units = unit_verdicts(shown), counts = tally(units.values()), runs = tally(shown.map(i => field('outcome', i)));
  const cards = h('div', {class: 'cards', id: 'summary'},
    h('div', {class: 'card'}, 'yield of units', h('b', {id: 'yield'}, percent(yield_of(counts))), h('span', {class: 'quiet'}, units.size + (units.size === 1 ? ' unit' : ' units'))),
    Object.keys(RANK).filter(word => counts[word]).reverse().map(word =>
      h('div', {class: 'card'}, verdict(word), h('b', {}, counts[word]), h('span', {class: 'quiet'}, (counts[word] === 1 ? 'unit; ' : 'units; ') + (runs[word] || 0) + (runs[word] === 1 ? ' run' : ' runs')))));
  return cards;
}
function by_station() {
  const groups = new Map();
  for (const i of shown) {
    const name = field('station', i);
    if (!groups.has(name)) groups.set(name, []);
    groups.get(name).push(i);
  }
  const rows = [...groups].sort((a, b) => a[0].localeCompare(b[0], undefined, {numeric: true})).map(([name, runs]) => {
    const counts = tally(unit_verdicts(runs).values()), y = yield_of(counts);
    const fill = h('i', {}); fill.style.width = (isFinite(y) ? 100 * y : 0) + '%';
    return h('tr', {}, h('td', {class: 'name'}, name || '(no station)'), ['PASS', 'FAIL', 'ERROR', 'MEASURED'].map(w => h('td', {class: 'number'}, counts[w] || 0)),
      h('td', {}, h('span', {class: 'bar', 'aria-hidden': 'true'}, fill), percent(y)));
  });
  return h('div', {class: 'scroll'}, h('table', {id: 'stations'}, h('caption', {class: 'quiet'}, 'Units by station'),
    h('thead', {}, h('tr', {}, h('th', {scope: 'col'}, 'station'), ['PASS', 'FAIL', 'ERROR', 'MEASURED'].map(w => h('th', {scope: 'col', class: 'number'}, w)), h('th', {scope: 'col'}, 'yield'))),
    h('tbody', {}, rows)));
}
const STEPS = [[1e3, 'second'], [10e3, '10 seconds'], [60e3, 'minute'], [600e3, '10 minutes'], [3600e3, 'hour'], [6 * 3600e3, '6 hours'], [864e5, 'day'], [7 * 864e5, 'week'], [28 * 864e5, '4 weeks']];
function over_time() {
  if (shown.length < 2) return null;
  let first = Infinity, last = -Infinity;
  for (const i of shown) { first = Math.min(first, D.start_millis[i]); last = Math.max(last, D.start_millis[i]); }
  const [width, name] = STEPS.find(([ms]) => (last - first) / ms <= 60) || STEPS[STEPS.length - 1];
  const buckets = new Map();
  for (const i of shown) {
    const at = Math.floor(D.start_millis[i] / width);
    if (!buckets.has(at)) buckets.set(at, {});
    const counts = buckets.get(at), word = field('outcome', i);
    counts[word] = (counts[word] || 0) + 1;
  }
  if (buckets.size < 2) return null;
  const x = [], rate = [], count = [];
  for (const [at, counts] of [...buckets].sort((a, b) => a[0] - b[0])) {
    const y = yield_of(counts);
    x.push((at + 0.5) * width / 1000); rate.push(isFinite(y) ? 100 * y : null); count.push(Object.values(counts).reduce((a, b) => a + b, 0));
  }
  const [box, host] = plot_box('Yield of runs over time', 'by ' + name + '; bars: how many runs');
  later(() => plot(host, c => ({
    options: {
      scales: {x: {time: true, range: around(width / 1000)}, y: {range: (u, a) => [Math.max(0, Math.min(90, Math.floor((a ?? 0) / 10) * 10 - 10)), 101]}, n: {range: (u, a, b) => [0, 3 * (b || 1)]}},
      axes: axes(c, '', 'yield [%]', {x: {values: clock, space: 75}, more: [{side: 1, scale: 'n', label: 'runs', stroke: c('quiet'), grid: {show: false}, size: 55}]}),
      series: [{label: 'time'}, {label: 'runs', scale: 'n', stroke: c('quiet'), fill: c('line'), paths: uPlot.paths.bars({size: [0.7, 40]}), points: {show: false}}, {label: 'yield [%]', stroke: c('curve'), width: 2, points: {show: true, size: 6}}]},
    data: [x, count, rate]})));
  return box;
}
let mask;
function readings_of(f) { // those that the filters let through
  const k = [];
  for (let j = 0; j < f.run.length; ++j) if (mask[f.run[j]]) k.push(j);
  return k;
}
/* Figures of a run that ended in ERROR are not to be trusted: they are shown with the run, and counted nowhere. */
const trusted = (f, ks) => ks.filter(k => { const word = field('outcome', f.run[k]); return word !== 'ERROR' && word !== 'ABORTED' && finite(f.value[k]); });

function figure_rows() {
  return D.figures.map((f, place) => {
    const ks = readings_of(f);
    if (!ks.length) return null;
    const numbers = trusted(f, ks).map(k => f.value[k]), m = moments(numbers), b = f.bounds[f.bound[ks[ks.length - 1]]];
    const bad = ks.filter(k => f.outcome[k] === 'FAIL' || f.outcome[k] === 'UNSET').length;
    const judged = ks.filter(k => f.outcome[k] !== 'MEASURED').length;
    const us = ks.map(k => f.uncertainty[k]).filter(finite), uncertainty = us.length ? us.reduce((a, x) => a + x, 0) / us.length : 0;
    return {f, place, m, b, last: ks[ks.length - 1], bad, judged, uncertainty, odd: ks.filter(k => typeof f.value[k] === 'string').length, capability: cpk(m, b)};
  }).filter(row => row);
}
function figures() {
  const rows = figure_rows();
  if (!rows.some(row => row.place === state.figure) && rows.length) state.figure = rows[0].place;
  const cell = text => h('td', {class: 'number'}, text), unsure = rows.some(r => r.uncertainty > 0);
  const row_of = r => h('tr', {class: r.place === state.figure ? 'chosen' : undefined},
    h('td', {class: 'name'}, h('button', {type: 'button', class: 'link', 'aria-pressed': String(r.place === state.figure), onclick: () => { state.figure = r.place; render('figure'); }}, broken_up(r.f.name))),
    cell(r.f.list ? 'a list' : r.odd ? [r.m.n + ' ', h('br'), '(+' + r.odd + ' not finite)'] : r.m.n), cell(r.m.n ? number(r.m.mean) : '–'), cell(isFinite(r.m.s) ? number(r.m.s) : '–'),
    cell(r.m.n ? number(r.m.min) : '–'), cell(r.m.n ? number(r.m.max) : '–'), unsure ? cell(r.uncertainty > 0 ? '± ' + Number((2 * r.uncertainty).toPrecision(2)) : '') : null,
    h('td', {}, r.f.unit === '1' ? '' : r.f.unit), h('td', {class: r.f.list ? undefined : 'whole'}, limits_text(r.f, r.last)), cell(isFinite(r.capability) ? r.capability.toFixed(2) : '–'),
    h('td', {class: 'whole'}, r.judged ? (r.bad ? verdict('FAIL') : verdict('PASS')) : verdict('MEASURED'), r.bad ? ' ' + r.bad + ' of ' + r.judged : ''));
  const steps = [...new Set(rows.map(r => r.f.step))], wide = unsure ? 11 : 10;
  const body = steps.map(step => h('tbody', {}, many_steps() ? h('tr', {}, h('th', {class: 'step', scope: 'rowgroup', colspan: wide}, step)) : null, rows.filter(r => r.f.step === step).map(row_of)));
  return h('div', {class: 'scroll'}, h('table', {id: 'figures'}, h('caption', {class: 'quiet'}, 'Count to Cpk leave out runs that ended in ERROR' + (unsure ? '; uncertainty: mean of the readings’, expanded (95 %)' : '')), h('thead', {}, h('tr', {}, h('th', {scope: 'col'}, 'figure'),
    ['count', 'mean', 'deviation', 'min', 'max', ...(unsure ? ['uncertainty'] : [])].map(t => h('th', {scope: 'col', class: 'number'}, t)), h('th', {scope: 'col'}, 'unit'), h('th', {scope: 'col'}, 'limits'),
    h('th', {scope: 'col', class: 'number'}, 'Cpk'), h('th', {scope: 'col'}, 'verdicts'))), body));
}
function histogram(values, extra) {
  const all = values.concat(extra);
  let low = Infinity, high = -Infinity;
  for (const x of all) { if (x < low) low = x; if (x > high) high = x; }
  if (!(high > low)) { low -= 0.5; high += 0.5; }
  const bins = Math.max(5, Math.min(80, Math.ceil(2 * Math.cbrt(values.length) * (high - low) / (spread(values) || high - low))));
  const width = (high - low) / bins, x = [], y = new Array(bins).fill(0);
  for (let i = 0; i < bins; ++i) x.push(low + (i + 0.5) * width);
  for (const v of values) ++y[Math.min(bins - 1, Math.floor((v - low) / width))];
  return [x, y, width];
}
function spread(values) {
  let low = Infinity, high = -Infinity;
  for (const x of values) { if (x < low) low = x; if (x > high) high = x; }
  return high - low;
}
function figure_detail() {
  const f = D.figures[state.figure], box = h('div', {id: 'figure'});
  if (!f) return box;
  const ks = trusted(f, readings_of(f));
  const b = ks.length ? f.bounds[f.bound[ks[ks.length - 1]]] : {};
  const us = ks.map(k => f.uncertainty[k]).filter(finite), u = us.length ? us.reduce((a, x) => a + x, 0) / us.length : 0;
  box.append(h('h3', {}, broken_up(short_name(f))), h('p', {}, f.docstring), h('p', {class: 'quiet'}, 'Method: ' + f.method));
  if (f.list) box.append(h('p', {}, 'A list: choose a run below to see which of its values are outside their limits.'));
  if (!ks.length) return box;
  const zone = 'red zone: beyond the limits; dashed: marginal' + (u > 0 ? '; yellow: guard band, the limit ± the expanded uncertainty (2 × ' + number(u) + ')' : '');
  const has_limits = 'min' in b || 'max' in b;
  const values = ks.map(k => f.value[k]);
  const [x, y, width] = histogram(values, ['min', 'max'].filter(s => s in b).map(s => b[s]));
  const [left, left_host] = plot_box('Distribution', has_limits ? zone : '');
  const picked = ks.find(k => f.run[k] === state.run);
  later(() => plot(left_host, c => ({
    options: {scales: {x: {time: false, range: (p, a, z) => [a - width, z + width]}, y: {range: (p, a, z) => [0, z * 1.1]}}, axes: axes(c, with_unit('value', f.unit === '1' ? '' : '[' + f.unit + ']'), 'runs'),
      legend: {show: false}, series: [{}, {label: 'runs', stroke: c('curve'), fill: c('curve') + '66', paths: uPlot.paths.bars({size: [0.9, 100]}), points: {show: false}}],
      hooks: {drawClear: [limit_marks(c, b, u, true)], draw: [limit_marks(c, b, u, true, true), p => {
        if (picked === undefined) return;
        const at = p.valToPos(f.value[picked], 'x', true), ctx = p.ctx;
        ctx.save(); ctx.fillStyle = c('pick'); ctx.beginPath(); ctx.moveTo(at, p.bbox.top + p.bbox.height); ctx.lineTo(at - 8, p.bbox.top + p.bbox.height + 14); ctx.lineTo(at + 8, p.bbox.top + p.bbox.height + 14); ctx.fill(); ctx.restore();
      }]}},
    data: [x, y]})));
  const order = ks.slice().sort((p, q) => D.start_millis[f.run[p]] - D.start_millis[f.run[q]]);
  const [right, right_host] = plot_box('Trend', 'one point a run, by its start; drag to look closer, double-click to go back');
  later(() => plot(right_host, c => ({
    options: {scales: {x: {time: true, range: around(Math.max(0.5, 0.01 * (D.start_millis[f.run[order[order.length - 1]]] - D.start_millis[f.run[order[0]]]) / 1000))}, y: {range: (p, a, z) => { const all = [a, z, ...['min', 'max'].filter(s => s in b).map(s => b[s])]; const lo = Math.min(...all), hi = Math.max(...all), pad = 0.06 * (hi - lo) || 0.5; return [lo - pad, hi + pad]; }}},
      axes: axes(c, '', f.unit === '1' ? '' : f.unit, {x: {values: clock, space: 75}}), legend: {show: false},
      series: [{}, {label: f.name, stroke: c('curve'), paths: () => null, points: {show: true, size: order.length > 2000 ? 2 : 5, fill: c('curve')}},
        {label: 'chosen', stroke: c('pick'), paths: () => null, points: {show: true, size: 13, width: 3, fill: c('back')}}],
      hooks: {drawClear: [limit_marks(c, b, u, false)], draw: [limit_marks(c, b, u, false, true)]}},
    data: [order.map(k => D.start_millis[f.run[k]] / 1000), order.map(k => f.value[k]), order.map(k => f.run[k] === state.run ? f.value[k] : null)]})));
  box.append(h('div', {class: 'two'}, left, right));
  return box;
}
function curve_data(curve, ks) {
  const x = Array.from({length: 101}, (_, i) => i / 100), data = [x];
  const real = row => row.map(v => v === null ? null : v / curve.scale);
  const banded = ks.length > MOST_CURVES;
  if (banded) {
    const bands = SHARES.map(() => []);
    for (let i = 0; i < 101; ++i) {
      const column = [];
      for (const k of ks) { const v = curve.points[k][i]; if (v !== null) column.push(v / curve.scale); }
      const sorted = Float64Array.from(column).sort();
      SHARES.forEach((share, s) => bands[s].push(sorted.length ? quantile(sorted, share) : null));
    }
    data.push(...bands);
  } else for (const k of ks) data.push(real(curve.points[k]));
  const picked = ks.find(k => curve.run[k] === state.run);
  if (picked !== undefined) data.push(real(curve.points[picked]));
  return {data, banded, picked};
}
function curves() {
  const boxes = D.curves.map(curve => {
    const ks = [];
    for (let k = 0; k < curve.run.length; ++k) if (mask[curve.run[k]]) ks.push(k);
    if (!ks.length) return null;
    const {data, banded, picked} = curve_data(curve, ks);
    const note = (banded ? 'bands of 5, 25, 50, 75 and 95 % of ' + ks.length + ' curves' : ks.length === 1 ? 'one curve' : ks.length + ' curves, one a run') +
      (picked === undefined ? '; choose a run below to see its curve on top' : '; on top, thick: ' + D.unit[state.run]) + '. The upper axis is in cycles per pixel.';
    const [box, host] = plot_box(short_name(curve), note);
    later(() => plot(host, c => {
      const alpha = Math.max(0.12, Math.min(1, 12 / ks.length)), hex = Math.round(255 * alpha).toString(16).padStart(2, '0');
      const line = {stroke: c('curve') + hex, width: 1, points: {show: false}};
      const bands = [{stroke: c('band'), width: 1, dash: [2, 4], label: '5 %'}, {stroke: c('band'), width: 1, dash: [6, 4], label: '25 %'}, {stroke: c('band'), width: 2, label: 'median'}, {stroke: c('band'), width: 1, dash: [6, 4], label: '75 %'}, {stroke: c('band'), width: 1, dash: [2, 4], label: '95 %'}]
        .map(s => ({...s, points: {show: false}}));
      const series = [{label: 'frequency'}, ...(banded ? bands : ks.map(() => ({...line})))];
      if (picked !== undefined) series.push({label: D.unit[state.run], stroke: c('pick'), width: 3, points: {show: false}});
      const options = {scales: {x: {time: false, range: [0, 1]}, y: {range: (p, a, z) => [Math.min(0, a), Math.max(1.1, z)]}},
        axes: axes(c, 'frequency [fraction of Nyquist]', 'response', {more: [{side: 0, scale: 'x', label: 'c/p', stroke: c('quiet'), grid: {show: false}, values: (p, v) => v.map(t => t / 2), size: 32}]}), series, legend: {show: false},
        bands: banded ? [{series: [5, 1], fill: c('band') + '22'}, {series: [4, 2], fill: c('band') + '44'}] : [],
        hooks: {drawClear: [p => { const at = p.valToPos(0.5, 'y', true), ctx = p.ctx; ctx.save(); ctx.strokeStyle = c('text'); ctx.setLineDash([3, 5]); ctx.beginPath(); ctx.moveTo(p.bbox.left, at); ctx.lineTo(p.bbox.left + p.bbox.width, at); ctx.stroke(); ctx.restore(); }]}};
      return {options, data};
    }));
    return box;
  }).filter(box => box);
  return boxes.length ? h('div', {class: 'two', id: 'curves'}, boxes) : null;
}
let by_run; // of each run: figure and place in it
function index_figures() {
  by_run = Array.from({length: N}, () => []);
  D.figures.forEach((f, place) => f.run.forEach((run, k) => by_run[run].push([place, k])));
}
const failed_figures = i => by_run[i].filter(([p, k]) => { const word = D.figures[p].outcome[k]; return word === 'FAIL' || word === 'UNSET'; });
const why = i => failed_figures(i).map(([p, k]) => D.figures[p].name + ' ' + reading(D.figures[p], k)).concat(D.details[i]).join('; ');
const COLUMNS = [['start', 'start'], ['unit', 'unit'], ['step', 'step'], ['outcome', 'verdict'], ['station', 'station'], ['lot', 'lot'], ['operator', 'operator'], ['failed', 'why']];
function run_list() {
  const used = COLUMNS.filter(([name]) => !column_of(name) || name === 'outcome' || column_of(name).values.some(w => w !== ''));
  const head = used.map(([name, label]) => h('th', {scope: 'col', 'aria-sort': state.sort[0] === name ? (state.sort[1] > 0 ? 'ascending' : 'descending') : 'none'},
    h('button', {type: 'button', 'data-sort': name, onclick: () => { state.sort = [name, state.sort[0] === name ? -state.sort[1] : 1]; state.page = 0; sort_runs(); render('runs'); focus_on('[data-sort="' + name + '"]'); }}, label + (state.sort[0] === name ? (state.sort[1] > 0 ? ' ▴' : ' ▾') : ''))));
  const cell = (name, i) => name === 'start' ? time(D.start_millis[i]) : name === 'outcome' ? verdict(field('outcome', i), D.marginal[i])
    : name === 'unit' ? h('button', {type: 'button', class: 'link', 'data-run': i, onclick: () => choose(i)}, D.unit[i] || '(no serial)') : name === 'failed' ? why(i) : field(name, i);
  const rows = shown.slice(state.page * PAGE, (state.page + 1) * PAGE).map(i => h('tr', {class: i === state.run ? 'chosen' : undefined}, used.map(([name]) => h('td', {class: name === 'start' ? 'time' : 'name'}, cell(name, i)))));
  const pages = Math.ceil(shown.length / PAGE);
  const turn = by => { state.page += by; render('runs'); };
  return h('div', {id: 'units'}, h('p', {class: 'quiet', id: 'count'}, shown.length + ' of ' + N + ' runs'), h('div', {class: 'scroll'}, h('table', {id: 'runs'}, h('thead', {}, h('tr', {}, head)), h('tbody', {}, rows))),
    pages > 1 ? h('p', {class: 'pager'}, h('button', {type: 'button', disabled: state.page === 0, onclick: () => turn(-1)}, 'Earlier page'), ` page ${state.page + 1} of ${pages} `, h('button', {type: 'button', disabled: state.page >= pages - 1, onclick: () => turn(1)}, 'Next page')) : null);
}
function focus_on(selector) { const found = document.querySelector(selector); if (found) found.focus(); }
function choose(i) {
  state.run = i;
  render('pick');
  const pane = $('pane');
  pane.focus({preventScroll: true}); pane.scrollIntoView({block: 'nearest'});
}
function run_pane() {
  const i = state.run, pane = h('section', {id: 'pane', tabindex: '-1', 'aria-label': 'Chosen run'});
  if (i < 0) return pane;
  pane.className = 'pane';
  const order = {FAIL: 0, UNSET: 1, PASS: 2, MEASURED: 3};
  const rows = by_run[i].slice().sort((a, b) => order[D.figures[a[0]].outcome[a[1]]] - order[D.figures[b[0]].outcome[b[1]]]).map(([p, k]) => {
    const f = D.figures[p];
    return h('tr', {}, h('td', {class: 'name'}, h('button', {type: 'button', class: 'link', onclick: () => { state.figure = p; render('figure'); $('figure').scrollIntoView({block: 'nearest'}); }}, broken_up(f.name))), h('td', {}, verdict(f.outcome[k], f.marginal[k])),
      h('td', {class: 'number'}, reading(f, k)), h('td', {}, limits_text(f, k)), h('td', {class: 'quiet'}, f.docstring.split('. ')[0].replace(/\.?$/, '.')));
  });
  const about = [['start', time(D.start_millis[i])], ['step', field('step', i)], ['station', field('station', i)], ['lot', field('lot', i)], ['operator', field('operator', i)], ['limits', field('limits', i)],
    ['library', field('library_version', i)], ['input', D.inputs[i].join(', ')], ...Object.keys(D.columns).map(name => [name, field(name, i)])].filter(([, word]) => word);
  pane.append(h('h3', {}, D.unit[i] || '(no serial)', ' ', verdict(field('outcome', i), D.marginal[i])), h('p', {class: 'quiet'}, about.map(([name, word]) => name + ' ' + word).join(' · ')),
    ...D.details[i].map(sentence => h('p', {}, sentence)),
    h('div', {class: 'scroll'}, h('table', {id: 'unit-figures'}, h('thead', {}, h('tr', {}, ['figure', 'verdict', 'value', 'limits', 'meaning'].map(t => h('th', {scope: 'col'}, t)))), h('tbody', {}, rows))),
    ...D.pictures.filter(p => p.run === i).map(p => h('figure', {}, h('img', {src: p.source, alt: p.name + ' of ' + D.unit[i]}), h('figcaption', {}, p.name))));
  if (D.logs[i].length) pane.append(h('details', {}, h('summary', {}, 'Log: ' + D.logs[i].length + ' lines'), h('pre', {}, D.logs[i].join('\n'))));
  pane.append(h('p', {}, h('button', {type: 'button', onclick: () => { state.run = -1; render('pick'); focus_on('[data-run="' + i + '"]'); }}, 'Close')));
  return pane;
}

/* --- the whole --- */
let waiting = [];
const later = work => waiting.push(work);   // plots need their place on the page first
function put(id, element) { const host = $(id); host.replaceChildren(...(element ? [].concat(element) : [])); }
function render(part) {
  mask = new Uint8Array(N);
  for (const i of shown) mask[i] = 1;
  if (!part) { put('s-summary', summary()); put('s-yield', [by_station(), over_time()].filter(x => x)); }
  if (!part || part === 'figure') put('s-figures', figures());
  if (part !== 'runs') put('s-figure', figure_detail());
  if (!part || part === 'pick') { const c = curves(); $('h-curves').hidden = !c; put('s-curves', c); put('s-pane', run_pane()); }
  if (part !== 'figure') put('s-runs', run_list());
  plots = plots.filter(p => p.host.isConnected || (p.drawn.destroy(), false));
  const work = waiting; waiting = [];
  work.forEach(draw => draw());
}
function start(data) {
  D = data; N = D.unit.length;
  document.title = D.title; $('title').textContent = D.title;
  let first = Infinity, last = -Infinity;
  for (const t of D.start_millis) { first = Math.min(first, t); last = Math.max(last, t); }
  const has = outcome => D.figures.findIndex(f => f.outcome.includes(outcome)), broken = has('FAIL');
  state.figure = Math.max(0, broken);
  $('about').textContent = N + (N === 1 ? ' run' : ' runs') + (N ? ', ' + time(first) + (N > 1 ? ' to ' + time(last) : '') : '') + ' · limits ' + (D.limits.values.filter(x => x).join(', ') || (broken >= 0 || has('PASS') >= 0 ? 'without a name' : 'none')) + ' · written ' + time(D.made_millis);
  index_figures();
  shown = Array.from({length: N}, (_, i) => i);
  if (N === 1) state.run = 0;
  const section = (title, id, more) => h('section', {}, h('h2', {id: 'h-' + id}, title), ...(more || [id]).map(x => h('div', {id: 's-' + x})));
  $('main').replaceChildren(h('div', {id: 's-summary'}), N > 1 ? filters() : h('span', {}), section('Yield', 'yield'), section('Figures', 'figures', ['figures', 'figure']), section('Curves', 'curves'), section('Runs', 'runs', ['pane', 'runs']));
  if (N === 1) $('h-yield').parentElement.hidden = true;
  sort_runs();
  render();
  document.documentElement.dataset.ready = 'yes';
}
const redraw = () => plots.forEach(p => p.draw());
matchMedia('(prefers-color-scheme: dark)').addEventListener('change', redraw);
/* Plots are pictures: they are drawn for paper before a dark screen is printed. */
addEventListener('beforeprint', () => { document.documentElement.dataset.paper = 'yes'; redraw(); });
addEventListener('afterprint', () => { delete document.documentElement.dataset.paper; redraw(); });
let timer; addEventListener('resize', () => { clearTimeout(timer); timer = setTimeout(redraw, 150); });
addEventListener('keydown', e => { if (e.key === 'Escape' && state.run >= 0 && N > 1) { state.run = -1; render('pick'); } });
async function unpack() {
  const text = atob($('data').textContent), bytes = new Uint8Array(text.length);
  for (let i = 0; i < text.length; ++i) bytes[i] = text.charCodeAt(i);
  const stream = new Blob([bytes]).stream().pipeThrough(new DecompressionStream('deflate'));
  return JSON.parse(await new Response(stream).text());
}
unpack().then(start, e => { $('wait').textContent = 'The data of this report cannot be read: ' + e.message; });
})();
