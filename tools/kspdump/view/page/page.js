// SPDX-License-Identifier: Apache-2.0
// Makes the page's tables and charts answer: filter, sort, open a row's picture, read values off.
//
// A section of the page is what was read together. It tells its `points` (captures or intervals) in a JSON block,
// and each row of its table has one with its `values`, one a point: a number, a list for an array, or null where it
// is missing. A number that a double would round comes as a string of its digits. Texts are only ever set as text.
'use strict';
(() => {

// ---- Making elements ----

const kSvg = 'http://www.w3.org/2000/svg';

function fill(node, attributes, children) {
  for (const [name, value] of Object.entries(attributes)) {
    if (name.startsWith('on')) node.addEventListener(name.slice(2), value);
    else if (value !== undefined && value !== false) node.setAttribute(name, value);
  }
  node.append(...children);
  return node;
}
const make = (tag, attributes = {}, ...children) => fill(document.createElement(tag), attributes, children);
const draw = (tag, attributes = {}, ...children) => fill(document.createElementNS(kSvg, tag), attributes, children);

// ---- Values ----

const asNumber = value => value === null || value === undefined ? NaN : Number(value);
const elementsOf = value => Array.isArray(value) ? value : [value];

// The difference of two values, exact also where doubles are not.
function difference(from, to) {
  const exact = typeof from === 'string' || typeof to === 'string';
  return exact ? (BigInt(to) - BigInt(from)).toString() : to - from;
}

// A value's digits, in groups of three that are set apart without a character.
function digits(value) {
  const span = make('span');
  if (value === null || value === undefined || Number.isNaN(value)) {
    span.textContent = '–';
    return span;
  }
  const text = typeof value === 'number' && !Number.isInteger(value) ? String(Number(value.toPrecision(6))) : String(value);
  const [, sign, whole, rest] = /^(-?)(\d*)(.*)$/.exec(text);
  const head = whole.length % 3 || 3;
  span.append(sign + whole.slice(0, head));
  for (let at = head; at < whole.length; at += 3) span.append(make('i', {}, whole.slice(at, at + 3)));
  span.append(rest);
  return span;
}

function short(value, precision = 4) {
  const size = Math.abs(value);
  for (const [unit, letter] of [[1e18, 'E'], [1e15, 'P'], [1e12, 'T'], [1e9, 'G'], [1e6, 'M'], [1e3, 'k']]) {
    if (size >= unit) return Number((value / unit).toPrecision(precision)) + letter;
  }
  return String(Number(value.toPrecision(precision)));
}

// The labels of an axis' ticks, which differ from each other.
function labelsOf(ticks) {
  const step = ticks.length > 1 ? ticks[1] - ticks[0] : 1;
  const precision = Math.ceil(Math.log10(Math.max(...ticks.map(Math.abs), 1) / step)) + 1;
  return ticks.map(tick => short(tick, Math.min(Math.max(precision, 4), 16)));
}

// How values become heights. The logarithm is of one more than the value, so that nothing is still nothing.
const kScales = {
  linear: {
    to: value => value,
    ticks(least, greatest, most) {
      const rough = (greatest - least) / most || 1;
      const power = 10 ** Math.floor(Math.log10(rough));
      const step = [1, 2, 5, 10].map(m => m * power).find(s => s >= rough * 0.999);
      const ticks = [];
      for (let i = Math.ceil(least / step); i * step <= greatest * 1.000001; ++i) ticks.push(i * step);
      return ticks;
    },
  },
  logarithmic: {
    to: value => Math.sign(value) * Math.log10(1 + Math.abs(value)),
    ticks(least, greatest, most) {
      const top = Math.max(Math.abs(least), Math.abs(greatest), 1);
      const each = Math.max(1, Math.ceil(Math.log10(top) / most));
      const ticks = [0];
      for (let e = 0; 10 ** e <= top; e += each) ticks.push(10 ** e, -(10 ** e));
      return ticks.filter(t => t >= least && t <= greatest).sort((a, b) => a - b);
    },
  },
};
let scale = kScales.linear;

// What must be drawn again when the scale or the page's width changes.
const redraws = new Set();
const redrawAll = () => redraws.forEach(redraw => redraw());

// ---- Reading off with pointer and keys ----

// Calls `read(column, row)` for what the pointer or the arrow keys are on. `at` gives these two for a pointer.
function readable(node, columns, rows, at, read) {
  let column = 0, row = 0, known = false;
  const go = (c, r) => {
    [column, row, known] = [Math.min(Math.max(c, 0), columns - 1), Math.min(Math.max(r, 0), rows - 1), true];
    read(column, row);
  };
  node.tabIndex = 0;
  node.addEventListener('pointermove', event => go(...at(event)));
  node.addEventListener('keydown', event => {
    const step = {ArrowLeft: [-1, 0], ArrowRight: [1, 0], ArrowUp: [0, 1], ArrowDown: [0, -1]}[event.key];
    if (!step || (step[1] && rows === 1)) return;
    event.preventDefault();
    go(...(known ? [column + step[0], row + step[1]] : [0, 0]));
  });
}

const share = (event, node) => {
  const box = node.getBoundingClientRect();
  return [(event.clientX - box.left) / box.width, (event.clientY - box.top) / box.height];
};

// ---- Pictures of a row ----

// A histogram: a bar a bin, and beside it the bar of the capture before where there are two.
function histogram(place, readout, sets, label) {
  const bins = Math.max(...sets.map(set => set.values.length));
  const width = Math.max(place.clientWidth, 240), height = 260;
  const box = {left: 52, right: 8, top: 18, bottom: 24};
  const plot = {width: width - box.left - box.right, height: height - box.top - box.bottom};
  const numbers = sets.flatMap(set => set.values.map(asNumber)).filter(v => !Number.isNaN(v));
  const least = Math.min(0, ...numbers), greatest = Math.max(0, ...numbers, least === 0 ? 1 : 0);
  const low = scale.to(least), high = scale.to(greatest);
  const y = value => box.top + plot.height * (1 - (scale.to(value) - low) / (high - low));
  const x = bin => box.left + plot.width * bin / bins;
  const picture = draw('svg', {viewBox: `0 0 ${width} ${height}`, height, role: 'img', 'aria-label': label});
  for (const tick of scale.ticks(least, greatest, 5)) {
    picture.append(draw('line', {class: 'grid', x1: box.left, x2: width - box.right, y1: y(tick), y2: y(tick)}),
                   draw('text', {x: box.left - 6, y: y(tick) + 4, 'text-anchor': 'end'}, short(tick)));
  }
  const slot = plot.width / bins, gap = slot > 6 ? 0.12 : 0;
  const bar = slot * (1 - 2 * gap) / sets.length;
  // All bars have their counts above them, or none.
  const isCounted = sets.length === 1 && slot > 7 * Math.max(...sets[0].values.map(value => String(value).length));
  sets.forEach((set, s) => set.values.forEach((value, bin) => {
    const number = asNumber(value);
    if (Number.isNaN(number)) return;
    const top = Math.min(y(number), y(0)), left = x(bin) + slot * gap + s * bar;
    picture.append(draw('rect', {class: set.class ?? (number < 0 ? 'down' : 'up'), x: left, y: top,
                                 width: bar, height: Math.abs(y(number) - y(0))}));
    if (isCounted) {
      picture.append(draw('text', {class: 'counts', x: left + bar / 2, y: top - 4,
                                   'text-anchor': 'middle'}, String(value)));
    }
  }));
  const every = Math.ceil(bins * 30 / plot.width);
  for (let bin = 0; bin < bins; bin += every) {
    picture.append(draw('text', {x: x(bin + 0.5), y: height - 6, 'text-anchor': 'middle'}, String(bin)));
  }
  const frame = draw('rect', {class: 'reading', y: box.top, height: plot.height, width: slot, visibility: 'hidden'});
  picture.append(frame);
  readable(picture, bins, 1, event => [Math.floor((share(event, picture)[0] * width - box.left) / slot), 0], bin => {
    frame.setAttribute('x', x(bin));
    frame.setAttribute('visibility', 'visible');
    readout.replaceChildren(`[${bin}]`);
    for (const set of sets) readout.append(` ${set.label} `, digits(set.values[bin]));
  });
  place.replaceChildren(picture);
}

// An array over its captures: a column a capture, a row a bin, the darker the more. Where there are more captures
// than columns on the screen, a column shows the greatest of its captures.
function heatMap(place, readout, values, nameOf, label) {
  const bins = Math.max(...values.map(list => list?.length ?? 0));
  const columns = Math.min(values.length, 2000);
  const from = column => Math.floor(column * values.length / columns);
  const canvas = make('canvas', {width: columns, height: bins, role: 'img', 'aria-label': label});
  const cell = make('div', {class: 'cell', hidden: ''});
  const height = bins * Math.max(2, Math.min(18, Math.floor(320 / bins)));
  canvas.style.height = height + 'px';
  const sizes = values.flatMap(list => (list ?? []).map(v => Math.abs(scale.to(asNumber(v)))));
  const greatest = sizes.reduce((most, size) => size > most ? size : most, 0) || 1;
  const paint = canvas.getContext('2d');
  const image = paint.createImageData(columns, bins);
  for (let column = 0; column < columns; ++column) {
    for (let bin = 0; bin < bins; ++bin) {
      let value = NaN;
      for (let i = from(column); i < from(column + 1); ++i) {
        const next = asNumber(values[i]?.[bin]);
        if (!(Math.abs(value) >= Math.abs(next))) value = Number.isNaN(next) ? value : next;
      }
      const colour = Number.isNaN(value) ? [128, 128, 128, 60]
        : [...(value < 0 ? [217, 115, 13] : [47, 129, 247]), Math.round(255 * Math.abs(scale.to(value)) / greatest)];
      image.data.set(colour, ((bins - 1 - bin) * columns + column) * 4);
    }
  }
  paint.putImageData(image, 0, 0);
  readable(canvas, values.length, bins, event => {
    const [right, down] = share(event, canvas);
    return [Math.floor(right * values.length), bins - 1 - Math.floor(down * bins)];
  }, (capture, bin) => {
    cell.hidden = false;
    cell.style.left = `calc(${100 * capture / values.length}% - 1px)`;
    cell.style.width = `calc(${100 / values.length}% + 2px)`;
    cell.style.top = `${height * (bins - 1 - bin) / bins}px`;
    cell.style.height = `${height / bins + 2}px`;
    readout.replaceChildren(`[${bin}] ${nameOf(capture)} `, digits(values[capture]?.[bin]));
  });
  const last = values.length - 1;
  const every = Math.ceil(bins / 10);
  const labels = make('div', {class: 'bins', 'aria-hidden': 'true'});
  for (let bin = bins - 1; bin >= 0; --bin) {
    if (bin % every !== 0) continue;
    const text = make('span', {}, `[${bin}]`);
    text.style.top = `${100 * (bins - bin - 0.5) / bins}%`;
    labels.append(text);
  }
  place.replaceChildren(make('div', {class: 'heat'}, labels, make('div', {class: 'cells'}, canvas, cell),
    make('div', {class: 'captures'}, make('span', {}, nameOf(0)), make('span', {}, nameOf(last)))));
}

// What an array's values can be shown as, over captures.
const kReadings = {
  'values': (list) => list,
  'change from the one before': (list, before) => list && before && list.map((v, i) => difference(before[i] ?? 0, v)),
  'share of the capture, %': list => {
    const total = list?.reduce((sum, v) => sum + asNumber(v), 0);
    return list && list.map(v => total ? 100 * asNumber(v) / total : 0);
  },
};

function valueTable(head, rows) {
  const body = make('tbody');
  const details = make('details', {}, make('summary', {}, 'Values'), make('div', {class: 'values'},
    make('table', {}, make('thead', {}, make('tr', {}, ...head.map(h => make('th', {scope: 'col', class: 'number'}, h)))), body)));
  details.addEventListener('toggle', () => {
    if (body.firstChild) return;
    for (const row of rows()) {
      body.append(make('tr', {}, make('th', {scope: 'row', class: 'number'}, row[0]),
                       ...row.slice(1).map(value => make('td', {class: 'number'}, digits(value)))));
    }
  });
  return details;
}

// The picture that a row opens: of an array its histogram or its heat map, of a number its line.
function openPicture(place, series, section) {
  const values = series.values;
  const isArray = values.some(Array.isArray);
  const readout = make('output');
  const picture = make('div', {class: 'picture'});
  const caption = make('figcaption', {}, isArray ? make('h3', {}, series.name) : '');
  place.append(make('figure', {}, caption, picture));
  const points = values.length;
  if (!isArray) {
    const charts = new TimeCharts(picture, section.axis, [{title: '', lines: [{name: series.name, values}]}]);
    place.append(valueTable([section.axis.label, series.name], () => values.map((v, i) => [section.axis.nameOf(i), v])));
    return () => charts.remove();
  }
  const label = `${series.name}: ${Math.max(...values.map(v => v?.length ?? 0))} elements`;
  let redraw;
  if (points <= 2) {
    const nameOf = i => points === 1 ? '' : ['old', 'new'][i];
    const sets = values.map((list, i) => ({label: nameOf(i), values: list ?? [], class: points === 2 && i === 0 ? 'before' : undefined}));
    const change = points === 2 && values[0] && values[1]
      ? [{label: 'change', values: values[1].map((v, i) => difference(values[0][i] ?? 0, v))}] : undefined;
    let shown = change ?? sets;
    redraw = () => histogram(picture, readout, shown, label);
    if (change) caption.append(choice('Show', {'change': change, 'old and new': sets}, chosen => {
      shown = chosen;
      redraw();
    }));
    place.append(valueTable(['element', ...sets.map(s => s.label || 'value'), ...(change ? ['change'] : [])],
      () => sets[0].values.map((v, bin) => [`[${bin}]`, ...[...sets, ...(change ?? [])].map(s => s.values[bin])])));
  } else {
    let reading = kReadings.values;
    redraw = () => heatMap(picture, readout, values.map((list, i) => reading(list, values[i - 1] ?? null) ?? null),
                           section.axis.nameOf, label);
    caption.append(choice('Show', kReadings, chosen => {
      reading = chosen;
      redraw();
    }));
  }
  caption.append(readout);
  redraw();
  redraws.add(redraw);
  return () => redraws.delete(redraw);
}

function choice(title, options, chosen) {
  const select = make('select', {'aria-label': title}, ...Object.keys(options).map(name => make('option', {}, name)));
  select.addEventListener('change', () => chosen(options[select.value]));
  return select;
}

// ---- Time charts: a column of them, with one cursor and one zoom ----

// The library's own legend makes inline styles, which the page's policy refuses; ours is made of buttons.
Dygraph.PLUGINS = Dygraph.PLUGINS.filter(plugin => plugin !== Dygraph.Plugins.Legend);

const kColours = ['#2f81f7', '#d9730d', '#2c9a48', '#a068f0', '#e0524c', '#1a97a8', '#d0589a', '#94801a'];

// The points from `first` to `last` in at most `columns` columns: of each column, every line's least and greatest in
// the order in which they came, so that no spike is lost.
function thin(x, lines, first, last, columns) {
  const rows = [];
  const count = last - first + 1;
  if (count <= 2 * columns) {
    for (let i = first; i <= last; ++i) rows.push([x[i], ...lines.map(line => line[i])]);
    return rows;
  }
  for (let column = 0; column < columns; ++column) {
    const from = first + Math.floor(column * count / columns), to = first + Math.floor((column + 1) * count / columns);
    const one = [x[from]], two = [x[to - 1]];
    for (const line of lines) {
      let least = -1, greatest = -1;
      for (let i = from; i < to; ++i) {
        if (Number.isNaN(line[i])) continue;
        if (least < 0 || line[i] < line[least]) least = i;
        if (greatest < 0 || line[i] > line[greatest]) greatest = i;
      }
      one.push(least < 0 ? NaN : line[Math.min(least, greatest)]);
      two.push(least < 0 ? NaN : line[Math.max(least, greatest)]);
    }
    rows.push(one, two);
  }
  return rows;
}

// The room of an axis' labels, which are at the ticks of the scale.
const kLabelWidth = 48;
function tickAtScale(least, greatest, pixels) {
  const back = value => scale === kScales.linear ? value : Math.sign(value) * (10 ** Math.abs(value) - 1);
  const ticks = scale.ticks(back(least), back(greatest), Math.max(2, Math.floor(pixels / 40)));
  const labels = labelsOf(ticks);
  return ticks.map((tick, i) => ({v: scale.to(tick), label: labels[i]}));
}

class TimeCharts {
  // `axis` has the points' places on it (`x`, rising), their name (`nameOf`) and its `label`; `groups` a chart each.
  constructor(host, axis, groups) {
    this.axis = axis;
    this.windows = [];
    this.cursor = -1;
    this.where = make('output', {}, kHint);
    this.back = make('button', {type: 'button', hidden: '', onclick: () => this.show([])}, 'Show all');
    host.append(make('div', {class: 'cursor-bar'}, this.where, this.back));
    this.said = make('div', {class: 'said', 'aria-live': 'polite'});
    host.append(this.said);
    this.charts = groups.map(group => this.add(host, group));
    this.redraw = () => this.draw();
    this.redraw();
    redraws.add(this.redraw);
  }

  remove() {
    redraws.delete(this.redraw);
    for (const chart of this.charts) chart.graph.destroy();
  }

  add(host, group) {
    const chart = {title: group.title, exact: group.lines.map(line => line.values), visible: group.lines.map(() => true)};
    chart.names = group.lines.map(line => line.name);
    chart.lines = chart.exact.map(values => Float64Array.from(values, asNumber));
    chart.values = group.lines.map(() => make('span', {class: 'value'}));
    // Of lines in several units, those that would lie flat at the bottom have the axis on the right.
    const heights = chart.lines.map(line => line.reduce((most, value) => value > most ? value : most, 0));
    const onRight = heights.map(height => group.isMixed === true && height * 8 < Math.max(...heights));
    const legend = make('div', {class: 'legend'}, ...group.lines.map((line, i) => {
      const swatch = make('span', {class: 'swatch'});
      swatch.style.background = kColours[i % kColours.length];
      return make('button', {type: 'button', 'aria-pressed': 'true', title: line.title, onclick: event => {
        chart.visible[i] = !chart.visible[i];
        event.currentTarget.setAttribute('aria-pressed', chart.visible[i]);
        chart.graph.setVisibility(i, chart.visible[i]);
      }}, swatch, line.name, onRight[i] ? ' (right)' : '', chart.values[i]);
    }));
    const canvas = make('div', {class: 'canvas'});
    const plain = {axisLabelWidth: kLabelWidth, ticker: tickAtScale};
    chart.line = make('div', {class: 'cursor', hidden: ''});
    const plot = make('div', {class: 'plot', tabindex: 0, role: 'group',
                              'aria-label': `${group.title || group.lines[0].name}: arrow keys move the cursor, + zooms, Escape goes back`},
                      canvas, chart.line);
    chart.plot = plot;
    host.append(make('div', {class: 'chart'}, group.title ? make('h3', {}, group.title, ' ', make('small', {class: 'faint'}, group.unit ?? '')) : '', legend, plot));
    chart.graph = new Dygraph(canvas, [[0, ...chart.lines.map(() => 0)]], {
      labels: ['x', ...group.lines.map((_, i) => String(i))],
      colors: kColours,
      highlightCircleSize: 0,
      strokeWidth: 1.5,
      includeZero: group.title !== '',
      gridLineColor: 'rgba(128,128,128,.25)',
      axisLineColor: 'rgba(128,128,128,.6)',
      connectSeparatedPoints: false,
      drawPoints: this.axis.x.length < 80,
      pointSize: 2,
      rightGap: 5 + (onRight.some(Boolean) ? 0 : kLabelWidth + 6),
      series: Object.fromEntries(onRight.map((isRight, i) => [String(i), {axis: isRight ? 'y2' : 'y'}])),
      axes: {x: {axisLabelFormatter: value => short(value)}, y: plain, y2: {...plain, drawGrid: false}},
      // A touch scrolls the page; dragging with a mouse zooms.
      interactionModel: {
        mousedown: Dygraph.defaultInteractionModel.mousedown,
        willDestroyContextMyself: true,
        dblclick: () => this.show(this.windows.slice(0, -1)),
      },
      zoomCallback: (from, to) => this.show([...this.windows, [from, to]]),
    });
    plot.addEventListener('pointermove', event => {
      const x = chart.graph.toDataXCoord(event.clientX - canvas.getBoundingClientRect().left);
      this.moveTo(this.nearest(x));
    });
    plot.addEventListener('keydown', event => this.key(event, chart));
    return chart;
  }

  get window() {
    const x = this.axis.x;
    return this.windows.at(-1) ?? [x[0], x[x.length - 1]];
  }

  // The point at or before a place on the axis, or the nearest one.
  before(place) {
    let low = 0, high = this.axis.x.length - 1;
    while (low < high) {
      const middle = (low + high + 1) >> 1;
      if (this.axis.x[middle] <= place) low = middle; else high = middle - 1;
    }
    return low;
  }
  nearest(place) {
    const x = this.axis.x, left = this.before(place), right = Math.min(left + 1, x.length - 1);
    return place - x[left] <= x[right] - place ? left : right;
  }

  show(windows) {
    this.windows = windows;
    this.back.hidden = windows.length === 0;
    this.draw();
  }

  draw() {
    const x = this.axis.x, [from, to] = this.window;
    const first = this.before(from), last = Math.min(this.before(to) + 1, x.length - 1);
    const room = (to - from || 1) * 0.01;
    for (const chart of this.charts) {
      const rows = thin(x, chart.lines, first, last, Math.max(chart.plot.clientWidth - 60, 100));
      for (const row of rows) for (let i = 1; i < row.length; ++i) row[i] = scale.to(row[i]);
      chart.graph.resize();
      chart.graph.updateOptions({file: rows, dateWindow: [from - room, to + room], valueRange: null});
    }
    this.moveTo(this.cursor);
  }

  moveTo(point) {
    this.cursor = point;
    if (point < 0) return;
    const place = this.axis.x[point], [from, to] = this.window;
    this.where.replaceChildren(this.axis.nameOf(point));
    for (const chart of this.charts) {
      chart.line.hidden = place < from || place > to;
      chart.line.style.left = chart.graph.toDomXCoord(place) + 'px';
      chart.values.forEach((node, i) => node.replaceChildren(digits(chart.exact[i][point])));
    }
  }

  key(event, chart) {
    const point = Math.max(this.cursor, 0), step = event.shiftKey ? 10 : 1, last = this.axis.x.length - 1;
    const to = {ArrowLeft: point - step, ArrowRight: point + step, Home: 0, End: last}[event.key];
    if (to !== undefined) {
      this.moveTo(Math.min(Math.max(to, 0), last));
      this.said.textContent = this.axis.nameOf(this.cursor) + ': ' +
        chart.names.map((name, i) => `${name} ${chart.values[i].textContent}`).join(', ');
    } else if (event.key === '+') {
      const [from, end] = this.window, quarter = (end - from) / 4, middle = this.axis.x[point];
      this.show([...this.windows, [Math.max(middle - quarter, from), Math.min(middle + quarter, end)]]);
    } else if (event.key === 'Escape' || event.key === '-') {
      this.show(this.windows.slice(0, -1));
    } else {
      return;
    }
    event.preventDefault();
  }
}

const kHint = 'Point at a chart to read its values; drag to zoom, double click to go back.';

// The charts of a snapshot: fields by label, those of arrays without their index.
const kGroups = [
  {title: 'Traffic', unit: 'sectors of 4 KiB', fields: ['HR', 'HW', 'NR', 'NW']},
  {title: 'Write amplification', unit: 'NW by HW', fields: ['NW/HW']},
  {title: 'Background work', isMixed: true, fields: ['E', 'GC', 'W', 'TH']},
  {title: 'Queues and fragments', isMixed: true, fields: ['BI', 'BU', 'V', 'BF', 'S', 'C']},
  {title: 'Read operations', fields: ['RO']},
  {title: 'Write operations', fields: ['WO']},
  {title: 'Mean read latency', unit: 'µs, RL by RO', fields: ['RL/RO']},
  {title: 'Mean write latency', unit: 'µs, WL by WO', fields: ['WL/WO']},
  {title: 'Greatest read latency', unit: 'µs', fields: ['RM']},
  {title: 'Greatest write latency', unit: 'µs', fields: ['WM']},
  {title: 'Total read latency', unit: 'µs', fields: ['RL']},
  {title: 'Total write latency', unit: 'µs', fields: ['WL']},
];

// A field's label without its index.
const fieldOf = name => name.replace(/_\d+$/, '');

// The groups that have fields here, and the fields that no group has in one of their own.
function chartsOf(lines) {
  const grouped = new Set(['T', ...kGroups.flatMap(group => group.fields)]);
  const rest = {title: 'Other fields', isMixed: true, fields: lines.map(line => fieldOf(line.name)).filter(name => !grouped.has(name))};
  return [...kGroups, rest]
    .map(group => ({...group, lines: group.fields.flatMap(field => lines.filter(line => fieldOf(line.name) === field))}))
    .map(group => ({...group, lines: [...new Set(group.lines)]}))
    .filter(group => group.lines.length > 0);
}

// ---- Sections and their tables ----

const rising = places => places.every((place, i) => Number.isFinite(place) && (i === 0 || place >= places[i - 1]));

class Section {
  constructor(node) {
    this.table = node.querySelector('.statistics');
    this.rows = [...this.table.tBodies[0].rows];
    const about = JSON.parse(node.querySelector('.about').textContent);
    this.axis = this.axisOf(about);
    if (about.view === 'snapshot' && this.rows.length > 0) {
      const lines = this.rows.map(row => this.series(row)).filter(series => !series.values.some(Array.isArray));
      const host = make('div', {class: 'charts'});
      this.table.closest('.scroll').before(host);
      new TimeCharts(host, this.axis, chartsOf(lines));
    }
    this.rows.forEach(row => this.prepare(row));
    [...this.table.tHead.rows[0].cells].forEach((cell, column) => this.prepareHead(cell, column));
  }

  series(row) {
    return row.series ??= JSON.parse(row.querySelector('script').textContent);
  }

  // Where the points lie: at what they are `over` where that rises, else in a row.
  axisOf(about) {
    const over = about.over ?? (about.view === 'snapshot' ? this.find('T') : undefined);
    const places = over?.values.map(asNumber);
    const isOver = places !== undefined && rising(places);
    const point = i => about.view === 'snapshot' ? `record ${about.points[i]}` : about.points[i];
    return {
      x: Float64Array.from(isOver ? places : about.points.keys()),
      label: isOver ? over.name : about.view === 'snapshot' ? 'record' : 'capture',
      nameOf: i => over ? `${over.name} ${over.values[i] ?? '–'}, ${point(i)}` : point(i),
    };
  }

  find(name) {
    const row = this.rows.find(row => row.querySelector('th').textContent === name);
    return row && this.series(row);
  }

  prepare(row) {
    row.searched = row.cells[0].textContent + ' ' + row.querySelector('th').textContent.toLowerCase();
    if (!row.classList.contains('opens')) return;
    const name = row.querySelector('th');
    const button = make('button', {type: 'button', 'aria-expanded': 'false'}, name.textContent);
    name.replaceChildren(button);
    row.addEventListener('click', event => {
      if (event.target.closest('button') !== null || getSelection().isCollapsed) this.toggle(row, button);
    });
  }

  toggle(row, button) {
    const isOpen = row.detail === undefined;
    if (isOpen) {
      const cell = make('td', {colspan: row.cells.length});
      row.detail = make('tr', {class: 'detail'}, cell);
      row.after(row.detail);
      row.close = openPicture(cell, this.series(row), this);
    } else {
      row.close();
      row.detail.remove();
      row.detail = undefined;
    }
    row.classList.toggle('open', isOpen);
    button.setAttribute('aria-expanded', isOpen);
  }

  prepareHead(cell, column) {
    const button = make('button', {type: 'button'}, cell.textContent);
    button.addEventListener('click', () => this.sort(cell, column));
    cell.replaceChildren(button);
  }

  sort(head, column) {
    // Numbers fall first, names rise first; another click turns them around.
    const isText = this.rows.every(row => row.cells[column].tagName === 'TH');
    const usual = isText || column === 0 ? 'ascending' : 'descending';
    const other = usual === 'ascending' ? 'descending' : 'ascending';
    const order = head.getAttribute('aria-sort') === usual ? other : usual;
    for (const cell of head.parentNode.cells) cell.removeAttribute('aria-sort');
    head.setAttribute('aria-sort', order);
    const sign = order === 'ascending' ? 1 : -1;
    const text = row => (row.cells[column].querySelector('.count') ?? row.cells[column]).textContent;
    const keyed = this.rows.map(row => {
      const key = text(row).replace('%', '');
      return {row, key: isText ? key.toLowerCase() : key.trim() === '' || Number.isNaN(Number(key)) ? Infinity * sign : Number(key)};
    });
    keyed.sort((a, b) => a.key === b.key ? 0 : a.key < b.key ? -sign : sign);
    this.rows = keyed.map(({row}) => row);
    this.table.tBodies[0].append(...this.rows.flatMap(row => row.detail ? [row, row.detail] : [row]));
  }

  // Shows the rows whose key or name has the text in it, or fits the pattern. Returns how many.
  filter(text) {
    const escaped = text.toLowerCase().replace(/[.+^${}()|[\]\\]/g, '\\$&');
    const pattern = /[*?]/.test(text) ? new RegExp(`(^| )${escaped.replace(/\*/g, '.*').replace(/\?/g, '.')}$`)
                                      : new RegExp(escaped);
    let shown = 0;
    for (const row of this.rows) {
      row.hidden = !pattern.test(row.searched);
      if (row.detail) row.detail.hidden = row.hidden;
      if (!row.hidden) ++shown;
    }
    return shown;
  }
}

// ---- The page ----

const sections = [...document.querySelectorAll('section')].map(node => new Section(node));
const total = sections.reduce((sum, section) => sum + section.rows.length, 0);
if (sections.length > 0) {
  document.title = document.querySelector('h1').textContent + (sections.length > 1 ? ` and ${sections.length - 1} more` : '');
  const count = make('span', {class: 'faint', role: 'status'}, `${total} rows`);
  const search = make('input', {type: 'search', placeholder: 'Filter by name or key, * and ? stand for any', 'aria-label': 'Filter by name or key'});
  search.addEventListener('input', () => {
    const shown = sections.reduce((sum, section) => sum + section.filter(search.value.trim()), 0);
    count.textContent = shown === total ? `${total} rows` : `${shown} of ${total} rows`;
  });
  const scales = Object.keys(kScales).map(name => make('button', {
    type: 'button', 'aria-pressed': String(kScales[name] === scale), onclick: event => {
      scale = kScales[name];
      scales.forEach(button => button.setAttribute('aria-pressed', String(button === event.currentTarget)));
      redrawAll();
    }}, name));
  const table = sections[0].table.closest('.scroll');
  const charts = document.querySelector('.charts');
  const scaling = make('span', {role: 'group', 'aria-label': 'Scale'}, ...scales);
  table.before(make('div', {class: 'tools'}, search, count, charts ? '' : scaling));
  charts?.before(make('div', {class: 'tools'}, scaling));
}

let isResizing = false;
addEventListener('resize', () => {
  if (isResizing) return;
  isResizing = true;
  requestAnimationFrame(() => {
    isResizing = false;
    redrawAll();
  });
});
// Charts have the width of what they were drawn on; paper is narrower.
for (const [event, isPaper] of [['beforeprint', true], ['afterprint', false]]) {
  addEventListener(event, () => {
    document.body.classList.toggle('paper', isPaper);
    redrawAll();
  });
}

})();
