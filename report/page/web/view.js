// The parts of the page put together: port, maps, table, search, keys, paper.

const maps = [];
let portMap = null;
let order = [];

function showPort() {
  const { port } = state;
  const { texts } = shown.details;
  const said = ['vnic.type', 'physnic.devname', 'mac'].map((key) => texts[key]).filter(Boolean).map(plain);
  const at = (key) => shown.data.get(key)?.find((value) => value !== null);
  if (at('vnic.ring1sz') !== undefined) said.push(`ring ${figure(at('vnic.ring1sz'))}`);
  const vcpus = [...shown.data.keys()].filter((key) => /^vcpu\.\d+\.used$/.test(key)).length;
  if (vcpus > 0) said.push(`${vcpus} vcpu${vcpus > 1 ? 's' : ''}`);
  byId('port-name').textContent = portName(port);
  byId('port-facts').textContent = [`(${portId(port)})`, portSwitch(port), ...said].join(' · ');
}

let wantedPort = 0;

async function loadPort() {
  const port = state.port;
  const turn = ++wantedPort;
  const loadedPort = { port, ...await portData(port) };
  if (turn !== wantedPort) return; // another one was chosen meanwhile
  shown = loadedPort;
  showPort();
  buildPlots(shown.data);
  buildValues();
  buildHistograms();
  await settled();
  showCursor();
  describeSoon();
}

// uPlot takes up new data and scales when the running code ends; positions are right behind that.
const settled = () => new Promise((done) => { setTimeout(done); });

let describing = 0;

function describeSoon() {
  clearTimeout(describing);
  describing = setTimeout(() => plots.forEach((entry) => describe(entry, shown.data, shown.port)), 200);
}

function showMap() {
  const figure = FIGURES[state.view];
  byId('ports-box').hidden = state.view === 'table';
  byId('worst').hidden = state.view !== 'table';
  byId('switches-box').hidden = state.view === 'table' || !switchStrips;
  for (const view of VIEWS) byId(`view-${view}`).setAttribute('aria-pressed', view === state.view);
  byId('sort').value = state.sort;
  byId('ports-axis').hidden = byId('legend').hidden = !figure;
  if (figure) byId('legend').replaceChildren(...legendOf(figure.thresholds, figure.word));
  else showTable();
}

function legendOf(steps, word) {
  const words = ['0', '> 0', ...steps.map((step) => short(step))];
  const boxes = words.map((text, level) => {
    const box = make('i');
    box.style.background = PALETTE[level];
    return make('span', {}, box, level > 1 ? `≥ ${text}` : text);
  });
  return [...boxes, make('span', {}, make('i', { class: 'hatched' }), 'missing'), make('em', {}, word)];
}

const TABLE = [
  ['lost', 'packets lost', (port, first, last) => SORT_BY.loss(port, first, last)],
  ['rx', 'rx loss %', (port, first, last) => share(port, first, last, 'rxeps', 'rxpps')],
  ['tx', 'tx loss %', (port, first, last) => share(port, first, last, 'txeps', 'txpps')],
  ['ready', 'worst ready', (port, first, last) => SORT_BY.ready(port, first, last)],
  ['cstp', 'worst cstp', (port, first, last) => SORT_BY.cstp(port, first, last)],
  ['rxpps', 'rx packets/s', (port, first, last) => mean(port, first, last, 'rxpps')],
  ['txpps', 'tx packets/s', (port, first, last) => mean(port, first, last, 'txpps')],
  ['rxmbps', 'rx Mbit/s', (port, first, last) => mean(port, first, last, 'rxmbps')],
  ['txmbps', 'tx Mbit/s', (port, first, last) => mean(port, first, last, 'txmbps')],
];

function share(port, first, last, lost, passed) {
  const dropped = overSpan(lost, port, first, last);
  const all = plus(dropped, overSpan(passed, port, first, last));
  return dropped === null || !(all > 0) ? dropped : Math.max(0, dropped) / all * 100;
}

function mean(port, first, last, key) {
  const column = loaded.get(key);
  let sum = 0;
  let count = 0;
  for (let record = first; column && record <= last; record++) {
    const value = valueAt(column, port, record);
    if (value !== null) { sum += value; count++; }
  }
  return count > 0 ? sum / count : null;
}

function tableRows(ports) {
  const [first, last] = recordsIn(state.from, state.to);
  return ports.map((port) => [portName(port), portId(port), portSwitch(port),
    ...TABLE.map(([, , value]) => { const number = value(port, first, last); return number === null ? null : +number.toFixed(2); })]);
}

function showTable() {
  const body = byId('worst').tBodies[0];
  const ports = order.slice(0, 200);
  body.replaceChildren(...tableRows(ports).map((row, i) => {
    const link = make('a', { href: `#port=${encodeURIComponent(row[1])}` }, row[0]);
    const cells = row.slice(1).map((value, column) => make('td', { class: column < 2 ? 'text' : null }, column < 2 ? value ?? '' : figure(value > 1000 ? Math.round(value) : value)));
    return make('tr', { 'aria-selected': String(ports[i] === state.port) }, make('th', { scope: 'row' }, link), ...cells);
  }));
  byId('worst').caption.textContent = order.length > 200 ? `200 of ${figure(order.length)} ports, over the span in view`
    : 'Ports over the span in view';
}

function showOrder() {
  order = orderedPorts();
  byId('count').textContent = order.length === PORTS ? '' : `${figure(order.length)} of ${figure(PORTS)} ports`;
  if (portMap) {
    portMap.rows = order;
    portMap.select(state.port);
  }
  if (state.view === 'table') showTable();
}

async function needOrder() {
  const keys = state.view === 'table' ? manifest.columns.map(({ key }) => key) : [];
  const bySort = { loss: ['rxeps', 'txeps'], ready: ['ready'], cstp: ['cstp'], packets: ['rxpps', 'txpps'] }[state.sort] ?? [];
  for (const key of [...keys, ...bySort]) loaded.set(key, await portColumn(key));
  if (FIGURES[state.view]) await loadFigure(state.view);
  showMap();
  showOrder();
  for (const map of maps) map.draw();
}

let switchStrips = false;
const stripCache = new Map();

function fillStrip(row, values) {
  const key = `${state.view} ${row}`;
  if (!stripCache.has(key)) {
    fillSwitch(state.view, row, values);
    stripCache.set(key, values.slice());
  }
  values.set(stripCache.get(key));
}

async function createMaps() {
  const rowHeight = matchMedia('(pointer: coarse)').matches ? 26 : 18;
  const steps = () => FIGURES[state.view]?.thresholds ?? [1, 2, 5, 10];
  portMap = createMap({
    box: byId('ports-box'), label: 'Ports, worst first', rowHeight, hover, steps,
    rowText: (port) => [portName(port), portId(port)],
    fill: (port, values) => (FIGURES[state.view] ? fillPort(state.view, port, values) : values.fill(NaN)),
    pick: (port, record) => change({ port, record }),
  });
  maps.push(portMap);
  switchStrips = PORTS > 500 && manifest.ports.switches.length > 1;
  if (switchStrips) {
    const sizes = manifest.ports.switch.reduce((all, place) => all.set(place, (all.get(place) ?? 0) + 1), new Map());
    const strips = createMap({
      box: byId('switches-box'), label: 'Switches: the worst of their ports', rowHeight, hover, steps,
      rowText: (row) => [plain(manifest.ports.switches[row]), `worst of ${figure(sizes.get(row) ?? 0)}`],
      fill: (row, values) => (FIGURES[state.view] ? fillStrip(row, values) : values.fill(NaN)),
      pick: (row, record) => { byId('search').value = manifest.ports.switches[row]; change({ query: manifest.ports.switches[row], record }); },
    });
    maps.push(strips);
    strips.rows = manifest.ports.switches.map((_, row) => row);
  }
  const used = await pcpuColumn('cpu.used');
  byId('pcpus').hidden = used === null;
  if (used === null) return;
  const pcpus = createMap({
    box: byId('pcpus-box'), label: 'Physical CPUs', rowHeight: 14, hover, steps: () => [25, 50, 75, 90],
    rowText: (row) => [`pcpu ${row}`, ''],
    fill: (row, values) => { for (let i = 0; i < RECORDS; i++) values[i] = valueAt(used, row, i) ?? NaN; },
    pick: (_, record) => change({ record }),
  });
  byId('pcpu-legend').replaceChildren(...legendOf([25, 50, 75, 90], '% used'));
  pcpus.rows = used.place.length ? Array.from(used.place, (_, row) => row) : [];
  maps.push(pcpus);
}

function showAxis() {
  const format = (time) => clock(Math.round(time));
  const middle = (state.from + state.to) / 2;
  byId('ports-axis').replaceChildren(make('span', {}, format(state.from)), make('span', {}, format(middle)), make('span', {}, format(state.to)));
  byId('zoomed').hidden = state.from === FIRST_TIME && state.to === LAST_TIME;
}

function savePort() {
  const [first, last] = recordsIn(state.from, state.to);
  const own = ownSeries();
  const rows = [['time', 'name', 'id', ...own.map(([key]) => key)]];
  for (let record = first; record <= last; record++) {
    rows.push([iso(TIMES[record]), manifest.ports.name[shown.port], portId(shown.port), ...own.map(([, series]) => series[record])]);
  }
  saveFile(`${manifest.host || 'host'}-${portId(shown.port)}.csv`, csvText(rows));
}

async function saveTable() {
  for (const { key } of manifest.columns) loaded.set(key, await portColumn(key));
  saveFile(`${manifest.host || 'host'}-ports.csv`, csvText([['name', 'id', 'switch', ...TABLE.map(([, title]) => title)], ...tableRows(order).map((row, i) => [manifest.ports.name[order[i]], ...row.slice(1)])]));
}

function step(rows) {
  const at = order.indexOf(state.port);
  const next = order[Math.min(Math.max(at + rows, 0), order.length - 1)];
  if (next !== undefined) change({ port: next });
}

const KEYS = {
  ArrowUp: () => step(-1), ArrowDown: () => step(1),
  ArrowLeft: () => moveTo(state.record - 1), ArrowRight: () => moveTo(state.record + 1),
  '+': () => zoom(0.5), '=': () => zoom(0.5), '-': () => zoom(2), 0: resetSpan,
  '/': () => byId('search').focus(), '?': () => byId('help').showModal(),
};

// Steps from record to record, and takes the view along where it is zoomed.
function moveTo(record) {
  record = Math.min(Math.max(record, 0), LAST);
  hovered = null;
  const width = state.to - state.from;
  if (STARTS[record] < state.from) setSpan(STARTS[record], STARTS[record] + width);
  else if (TIMES[record] > state.to) setSpan(TIMES[record] - width, TIMES[record]);
  change({ record });
}

function onKey(event) {
  if (event.ctrlKey || event.altKey || event.metaKey || byId('help').open) return;
  if (event.key === 'Escape') {
    if (state.query !== '' || document.activeElement === byId('search')) {
      byId('search').value = '';
      change({ query: '' });
      document.activeElement.blur();
    } else resetSpan();
    return;
  }
  if (/^(INPUT|SELECT|TEXTAREA)$/.test(event.target.tagName)) return;
  const action = KEYS[event.key];
  const scrolls = event.target.closest('#findings, #values, #histogram-box') && /^Arrow(Up|Down)$/.test(event.key);
  if (!action || scrolls) return;
  event.preventDefault();
  action();
}

// Colours are variables of the style sheet: drawing again is all that a change of them needs.
function redraw() {
  for (const entry of plots) {
    entry.uplot?.redraw(false);
    drawSwatches(entry);
  }
  for (const map of maps) map.draw();
}

function onPaper(print) {
  document.documentElement.classList.toggle('paper', print);
  for (const entry of plots) entry.uplot?.setSize(sizeOf(entry));
  redraw();
}

function listen() {
  onChange(['port'], () => { portMap.select(state.port); if (state.view === 'table') showTable(); loadPort(); speak(); });
  onChange(['record'], () => { showCursor(); speak(); });
  onChange(['from', 'to'], () => {
    showAxis();
    showOrder();
    for (const map of maps) map.draw();
    for (const { uplot } of plots) uplot?.setScale('x', { min: state.from, max: state.to });
    settled().then(showCursor);
    describeSoon();
  });
  onChange(['view', 'sort'], needOrder);
  onChange(['query'], () => { byId('search').value = state.query; showOrder(); });
  for (const view of VIEWS) {
    byId(`view-${view}`).addEventListener('click', () => change(view === 'table' ? { view } : { view, sort: view }));
  }
  byId('sort').addEventListener('change', (event) => change({ sort: event.target.value }));
  byId('search').addEventListener('input', (event) => change({ query: event.target.value }));
  byId('search').addEventListener('keydown', (event) => {
    if (event.key === 'Enter' && order.length > 0) { change({ port: order[0] }); event.target.blur(); }
  });
  byId('help-open').addEventListener('click', () => byId('help').showModal());
  byId('zoomed').addEventListener('click', resetSpan);
  byId('save-port').addEventListener('click', savePort);
  byId('save-table').addEventListener('click', saveTable);
  document.addEventListener('keydown', onKey);
  addEventListener('hashchange', readHash);
  addEventListener('beforeprint', () => onPaper(true));
  addEventListener('afterprint', () => onPaper(false));
  matchMedia('(prefers-color-scheme: dark)').addEventListener('change', redraw);
  narrow.addEventListener('change', () => {
    buildPlots(shown.data);
    settled().then(showCursor);
  });
}
