// The plots of the chosen port, on one time axis, each a question. Lines have a colour and a dash by their role, the
// same in every plot. uPlot draws; zoom, cursor and captions are ours, so that maps and plots move together.

const COLOURS = {
  received: '--received', sent: '--sent', drops: '--drops', ready: '--ready', used: '--used', costop: '--costop', plain: '--text',
};
const DASHES = { line: [], dash: [7, 4], dots: [2, 3], mixed: [8, 3, 2, 3], long: [14, 4] };

const line = (key, role, dash = 'line', label = key) => ({ key, role, dash, label });

// Series of one port: from the columns of all ports, its own details, and what is worked out of them.
const PLOTS = [
  { id: 'A', title: 'Drops/s', question: 'when, which way?', unit: 'packets/s', grow: 3,
    lines: () => [line('rxeps', 'drops'), line('txeps', 'drops', 'dash')] },
  { id: 'B', title: 'Where', question: 'ring or queue?', unit: 'events/s', grow: 3,
    lines: () => [
      line('vnic.r1full', 'received', 'line', 'r1full'), line('vnic.r2full', 'received', 'dots', 'r2full'),
      line('vnic.rxbuflow', 'received', 'line', 'rxbuflow'), line('vnic.ooslots', 'received', 'dots', 'ooslots'),
      line('vnic.qstop', 'sent', 'dash', 'qstop'), line('vnic.txdisc', 'sent', 'dots', 'txdisc'),
      line('vnic.txallocerr', 'sent', 'mixed', 'txallocerr')] },
  { id: 'C', title: 'Guest CPU', question: 'vcpu kept off?', unit: '%', grow: 3,
    lines: () => [line('ready', 'ready'), line('cstp', 'costop', 'dots'), line('=used', 'used', 'line', 'used')] },
  { id: 'D', title: 'Workers', question: 'host short of CPU?', unit: '%', grow: 3, lines: workerLines },
  { id: 'E', title: 'Traffic', question: 'small packets?', unit: 'packets/s', grow: 2,
    lines: () => [line('rxpps', 'received'), line('txpps', 'sent', 'dash')] },
  { id: 'E2', title: 'Mbit/s', question: '', unit: 'Mbit/s', grow: 2,
    lines: () => [line('rxmbps', 'received'), line('txmbps', 'sent', 'dash')] },
  { id: 'F', title: 'Uplink', question: 'lost at the link?', unit: 'events/s', grow: 3, lines: uplinkLines },
];
const MOST_LINES = 12;

// used and ready of each worker, the busiest pcpu behind them. More than 12: the worst, and a band of the rest.
function workerLines(data) {
  const lines = [line('=pcpu', 'plain', 'dots', 'top pcpu')];
  const dashes = Object.keys(DASHES);
  for (let i = 0; data.has(`wdt.${i}.used`); i++) {
    const dash = dashes[i % dashes.length];
    lines.push(line(`wdt.${i}.used`, 'used', dash, `${i} used`), line(`wdt.${i}.ready`, 'ready', dash, `${i} ready`));
  }
  return lines;
}

function uplinkLines() {
  return [line('=physnic.rxeps', 'drops', 'line', 'rxeps'), line('=physnic.txeps', 'drops', 'dash', 'txeps'),
    line('=qstops', 'sent', 'dash', 'qstops'), line('=intr.used', 'used', 'line', 'intr used %')];
}

const uplinks = new Map(); // by switch: { port, of } as below

// The uplink that a port's packets may leave by: itself, or of those of its switch with details the one that loses
// most, then the busiest. -1: none. `of` is the count to choose from.
async function uplinkOf(port) {
  if (manifest.ports.uplink[port]) return { port, of: 1 };
  const place = manifest.ports.switch[port];
  if (uplinks.has(place)) return uplinks.get(place);
  const best = { port: -1, of: 0 };
  const sum = (series) => (series ?? []).reduce((total, value) => total + (value ?? 0), 0);
  let most = [-1, -1];
  for (const other of Object.keys(manifest.details).map(Number)) {
    if (!manifest.ports.uplink[other] || manifest.ports.switch[other] !== place) continue;
    best.of++;
    const { series } = await portDetails(other);
    const packets = await Promise.all(['rxpps', 'txpps'].map(portColumn));
    const weight = [sum(series.get('physnic.rxeps')) + sum(series.get('physnic.txeps')),
      sum(packets.flatMap((column) => (column ? seriesOf(column, other) : [])))];
    if (weight[0] > most[0] || (weight[0] === most[0] && weight[1] > most[1])) {
      most = weight;
      best.port = other;
    }
  }
  uplinks.set(place, best);
  return best;
}

// The worst of several series at each record; null where all are missing.
function worstOf(parts) {
  return TIMES.map((_, record) => parts.reduce((worst, part) => {
    const value = part[record];
    return value === null || (worst !== null && worst >= value) ? worst : value;
  }, null));
}

// All series of a port by key: what the plots draw, the values show and CSV files hold. Behind a "=" stands what is
// worked out of others, or belongs to the uplink: for plots alone.
async function portData(port) {
  const data = new Map();
  for (const { key } of manifest.columns) data.set(key, seriesOf(await portColumn(key), port));
  const details = await portDetails(port);
  for (const [key, series] of details.series) data.set(key, series);
  const numbered = (pattern) => [...details.series].filter(([key]) => pattern.test(key)).map(([, series]) => series);
  if (details.series.has('vcpu.0.used')) data.set('=used', worstOf(numbered(/^vcpu\.\d+\.used$/)));
  const pcpu = await pcpuColumn('cpu.used');
  if (pcpu) data.set('=pcpu', worstOf(Array.from({ length: pcpu.place.length }, (_, row) => seriesOf(pcpu, row))));
  const uplink = await uplinkOf(port);
  const link = uplink.port < 0 ? new Map() : (await portDetails(uplink.port)).series;
  for (const [key, series] of link) if (/^(physnic|intr)\./.test(key)) data.set(`=${key}`, series);
  const stops = [...link].filter(([key]) => /^txqueue\.\d+\.qstops$/.test(key)).map(([, series]) => series);
  if (stops.length > 0) {
    data.set('=qstops', TIMES.map((_, record) => stops.reduce((sum, part) => plus(sum, part[record]), null)));
  }
  return { data, details, uplink };
}

// The drawn x axis has a point without values in each gap of time, so that no line bridges it.
const drawnTimes = [];
const drawnRecords = [];
TIMES.forEach((time, record) => {
  if (record > 0 && STARTS[record] > TIMES[record - 1]) {
    drawnTimes.push((TIMES[record - 1] + STARTS[record]) / 2 + STEP / 1000);
    drawnRecords.push(-1);
  }
  drawnTimes.push(time);
  drawnRecords.push(record);
});
const drawn = (series) => drawnRecords.map((record) => (record < 0 ? null : series[record]));

const variable = (name) => getComputedStyle(document.documentElement).getPropertyValue(name).trim();
const plots = []; // { plot, figure, uplot, lines, captions }

function axes(last) {
  const common = {
    stroke: () => variable('--muted'), grid: { stroke: () => variable('--grid'), width: 1 },
    ticks: { stroke: () => variable('--grid'), width: 1, size: 3 }, font: '11px system-ui, sans-serif',
  };
  return [
    { ...common, show: last, size: 20, gap: 2, space: 70,
      values: (_, ticks) => ticks.map(tickText) },
    { ...common, size: 46, gap: 3, space: 22, values: (_, ticks) => ticks.map(short) },
  ];
}

function tickText(time) {
  const span = state.to - state.from;
  return iso(time).slice(11, span < 5 ? 23 : span < 300 ? 19 : 16);
}

function rangeOf(plot) {
  return (_, least, most) => {
    const bottom = Math.min(0, least ?? 0);
    let top = Math.max(most ?? 0, 0);
    if (plot.unit === '%') top = Math.max(top, 100);
    return [bottom, top > bottom ? top * 1.04 : bottom + 1];
  };
}

function seriesOptions({ role, dash, label }, band) {
  return {
    label, stroke: () => (band ? 'transparent' : variable(COLOURS[role])), dash: DASHES[dash], width: dash === 'dots' ? 1.8 : 1.5,
    points: { show: (uplot) => !band && fewRecords(uplot), filter: band ? () => null : single, size: 4, fill: () => variable(COLOURS[role]) },
  };
}

// A value between two gaps has no line: the places of such values, null for all where points are shown anyway.
function single(uplot, index, show) {
  if (show) return null;
  const values = uplot.data[index];
  const places = [];
  const [first, last] = uplot.series[0].idxs;
  for (let i = first; i <= last; i++) {
    if (values[i] !== null && (values[i - 1] ?? null) === null && (values[i + 1] ?? null) === null) places.push(i);
  }
  return places;
}

function fewRecords(uplot) {
  const [first, last] = recordsIn(uplot.scales.x.min, uplot.scales.x.max);
  return last - first < 40;
}

// Lines that the port has, at most 12, the worst of a longer list; the rest as one band from least to most.
function chosenLines(plot, data) {
  const wanted = plot.lines(data).flatMap((entry) => [entry, // time in buckets: the maximum as a line, the mean with dots
    ...(data.has(`${entry.key}~mean`) ? [line(`${entry.key}~mean`, entry.role, 'dots', `${entry.label} mean`)] : [])]);
  const lines = wanted.filter(({ key }) => data.has(key) && data.get(key).some((value) => value !== null));
  if (lines.length <= MOST_LINES) return { lines, rest: [] };
  const peak = (entry) => data.get(entry.key).reduce((worst, value) => Math.max(worst, value ?? 0), 0);
  const worst = [...lines].sort((a, b) => peak(b) - peak(a)).slice(0, MOST_LINES);
  return { lines: lines.filter((entry) => worst.includes(entry)), rest: lines.filter((entry) => !worst.includes(entry)) };
}

function sentence(plot, lines, data, port) {
  const [first, last] = recordsIn(state.from, state.to);
  const parts = lines.map(({ key, label }) => {
    let worst = null;
    let sum = 0;
    let count = 0;
    for (let record = first; record <= last; record++) {
      const value = data.get(key)[record];
      if (value === null) continue;
      sum += value;
      count++;
      if (worst === null || value > data.get(key)[worst]) worst = record;
    }
    if (worst === null) return `${label} missing`;
    return `${label} at most ${figure(data.get(key)[worst])} at ${clock(TIMES[worst])}, mean ${figure(+(sum / count).toFixed(2))}`;
  });
  return `${plot.title} of ${portName(port)} in ${plot.unit}: ${parts.join('; ') || 'no data'}`;
}

// The same for those who can't see it: 25 rows over the span in view.
function describe(entry, data, port) {
  entry.figure.setAttribute('aria-label', sentence(entry.plot, entry.lines, data, port));
  const [first, last] = recordsIn(state.from, state.to);
  const rows = Math.min(25, last - first + 1);
  const body = make('tbody');
  for (let i = 0; i < rows; i++) {
    const record = rows < 2 ? first : first + Math.round(i * (last - first) / (rows - 1));
    body.append(make('tr', {}, make('th', { scope: 'row' }, clock(TIMES[record])),
      ...entry.lines.map(({ key }) => make('td', {}, figure(data.get(key)[record])))));
  }
  const head = make('tr', {}, make('th', { scope: 'col' }, 'time'),
    ...entry.lines.map(({ label }) => make('th', { scope: 'col' }, label)));
  entry.table.replaceChildren(make('thead', {}, head), body);
}

function caption(entry) {
  entry.captions = entry.lines.map(({ role, dash, label }) => {
    const value = make('span', { class: 'legend-value' }, '–');
    const swatch = make('canvas', { class: 'swatch', width: '44', height: '4', 'aria-hidden': 'true' });
    entry.legend.append(make('span', { class: 'legend' }, swatch, `${label} `, value));
    return { value, swatch, role, dash };
  });
  drawSwatches(entry);
}

function drawSwatches(entry) {
  for (const { swatch, role, dash } of entry.captions) {
    const context = swatch.getContext('2d');
    context.clearRect(0, 0, 44, 4);
    context.strokeStyle = variable(COLOURS[role]);
    context.lineWidth = 4;
    context.setLineDash(DASHES[dash].map((length) => length * 2));
    context.beginPath();
    context.moveTo(0, 2);
    context.lineTo(44, 2);
    context.stroke();
  }
}

const narrow = matchMedia('(max-width: 899px)');

function buildPlot(entry, data) {
  const { lines, rest } = chosenLines(entry.plot, data);
  entry.lines = lines;
  entry.uplot?.destroy();
  entry.legend.replaceChildren();
  caption(entry);
  const columns = [drawnTimes, ...lines.map(({ key }) => drawn(data.get(key)))];
  const series = [{}, ...lines.map((each) => seriesOptions(each, false))];
  const bands = [];
  if (rest.length > 0) {
    const worst = worstOf(rest.map(({ key }) => data.get(key)));
    const least = worstOf(rest.map(({ key }) => data.get(key).map((value) => (value === null ? null : -value))));
    columns.push(drawn(worst), drawn(least.map((value) => (value === null ? null : -value))));
    series.push(seriesOptions(rest[0], true), seriesOptions(rest[0], true));
    bands.push({ series: [series.length - 2, series.length - 1], fill: () => variable('--band') });
    entry.legend.append(make('span', { class: 'legend' }, `${rest.length} more: band`));
  }
  entry.figure.classList.toggle('empty', lines.length === 0);
  const last = narrow.matches || entry.last;
  entry.uplot = new uPlot({
    ...sizeOf(entry), legend: { show: false }, padding: [6, 24, last ? 0 : 6, 0], series, bands, axes: axes(last),
    tzDate: (time) => uPlot.tzDate(new Date(time * 1e3), 'Etc/UTC'),
    scales: { x: { time: true, range: () => [state.from, state.to] }, y: { range: rangeOf(entry.plot) } },
    cursor: { y: false, drag: { x: true, y: false, setScale: false }, points: { size: 6 }, bind: {
      dblclick: () => resetSpan,
      mouseleave: (uplot, target, handler) => (event) => { handler(event); hover(null); },
    } },
    hooks: { setSelect: [selected], setCursor: [moved], init: [(uplot) => uplot.over.addEventListener('click', clicked)] },
  }, columns, entry.holder);
}

function uplinkText({ question }) {
  const { port, of } = shown.uplink;
  return port < 0 ? question : of > 1 ? `${portName(port)}, worst of ${of}` : `of ${portName(port)}`;
}

// All plots of a port; the last one that has lines bears the time axis.
function buildPlots(data) {
  const filled = plots.filter(({ plot }) => chosenLines(plot, data).lines.length > 0);
  for (const entry of plots) {
    if (entry.plot.id === 'F') entry.question.textContent = uplinkText(entry.plot);
    entry.last = entry === (filled[filled.length - 1] ?? plots[plots.length - 1]);
    buildPlot(entry, data);
  }
}

function sizeOf(entry) {
  return { width: Math.max(60, entry.holder.clientWidth), height: Math.max(40, entry.holder.clientHeight) };
}

let dragged = false;

function selected(uplot) {
  const { left, width } = uplot.select;
  if (width < 6) return;
  dragged = true;
  const from = uplot.posToVal(left, 'x');
  const to = uplot.posToVal(left + width, 'x');
  uplot.setSelect({ left: 0, width: 0, top: 0, height: 0 }, false);
  setSpan(from, to);
}

let moving = false; // we move the cursors ourselves

function moved(uplot) {
  const index = uplot.cursor.idx;
  if (moving || index === null || index === undefined || uplot.cursor.left < 0) return;
  const record = drawnRecords[index];
  hover(record < 0 ? drawnRecords[index - 1] : record, uplot);
}

function clicked() {
  if (dragged) dragged = false;
  else if (hovered !== null) change({ record: hovered });
}

// Puts the cursor of every plot onto a record, but not of the one that the mouse is in: it may be dragging.
function placeCursors(record, source) {
  moving = true;
  const index = drawnRecords.indexOf(record);
  for (const { uplot } of plots) {
    if (!uplot || uplot === source) continue;
    const left = uplot.valToPos(drawnTimes[index], 'x');
    uplot.setCursor({ left: left >= 0 && left <= uplot.over.clientWidth ? left : -10, top: 0 }, false);
  }
  moving = false;
}

function showLegends(record, data) {
  for (const { lines, captions } of plots) {
    lines.forEach(({ key }, i) => { captions[i].value.textContent = short(data.get(key)[record]); });
  }
}

function createPlots(box) {
  for (const plot of PLOTS) {
    const legend = make('div', { class: 'legends' });
    const holder = make('div', { class: 'holder' });
    const table = make('table');
    const question = make('span', {}, plot.question);
    const unit = plot.title.endsWith('/s') ? '' : `, ${plot.unit}`;
    const name = make('b', {}, `${plot.id === 'E2' ? '' : plot.id} ${plot.title}${unit}`.trim());
    const title = make('figcaption', {}, make('div', { class: 'question' }, name, ' ', question), legend);
    const element = make('figure', { class: 'plot', id: `plot-${plot.id}` }, title, holder, make('div', { class: 'unseen' }, table));
    element.style.flexGrow = plot.grow;
    box.append(element);
    const entry = { plot, question, figure: element, holder, legend, table, lines: [], captions: [] };
    plots.push(entry);
    new ResizeObserver(() => entry.uplot?.setSize(sizeOf(entry))).observe(holder);
  }
}
