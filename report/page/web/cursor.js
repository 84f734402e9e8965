// What stands at the cursor: all values of the chosen port at one record, and its histograms. The cursor is where the
// mouse is; away from maps and plots it is the chosen record.

let hovered = null;
let shown = { port: -1, data: new Map(), details: { series: new Map(), texts: {}, histograms: [] }, uplink: { port: -1, of: 0 } };
let source = null;
let frame = 0;

const cursorRecord = () => hovered ?? state.record;

function hover(record, uplot = null) {
  if (hovered === record && source === uplot) return;
  hovered = record;
  source = uplot;
  if (frame === 0) frame = requestAnimationFrame(showCursor);
}

function showCursor() {
  cancelAnimationFrame(frame);
  frame = 0;
  const record = cursorRecord();
  byId('at').textContent = `${day(TIMES[record])} ${clock(TIMES[record])} UTC`;
  for (const map of maps) map.cursor(record);
  placeCursors(record, source);
  showLegends(record, shown.data);
  showValues(record);
  showHistograms(record);
}

// Keys of one section stand together: vnic, vcpu 0, wdt 1, ...; what changes least comes last.
const sectionOf = (key) => (/^(.*)\.[^.]+$/.exec(key) ?? [null, 'port'])[1];
const SECTIONS = ['port', 'vnic', 'physnic', 'intr', 'vcpu', 'wdt', 'txqueue', 'rxqueue'];
const rankOf = (section) => (SECTIONS.indexOf(section.split('.')[0]) + SECTIONS.length + 1) % (SECTIONS.length + 1);

// Without what plots have besides.
const ownSeries = () => [...shown.data].filter(([key]) => !key.startsWith('='));

let cells = []; // [element, series]

function buildValues() {
  const box = byId('values');
  box.replaceChildren();
  cells = [];
  const sections = new Map();
  for (const [key, series] of ownSeries()) {
    const section = sectionOf(key);
    if (!sections.has(section)) sections.set(section, []);
    sections.get(section).push([key, series]);
  }
  for (const [section, entries] of [...sections].sort(([a], [b]) => rankOf(a) - rankOf(b))) {
    const list = make('dl', {});
    for (const [key, series] of entries) {
      const value = make('dd', {}, '–');
      cells.push([value, series]);
      list.append(make('div', {}, make('dt', {}, key.slice(key.lastIndexOf('.') + 1)), value));
    }
    const said = Object.entries(shown.details.texts).filter(([key]) => sectionOf(key) === section);
    const words = said.map(([, text]) => plain(text)).join(' ');
    box.append(make('section', {}, make('h3', { title: words }, section.replace('.', ' '), ' ', make('small', {}, words)), list));
  }
  if (shown.details.none) {
    box.append(make('p', { class: 'quiet' }, 'This page holds no further keys of this port: it is not among the worst. See --detail.'));
  }
}

function showValues(record) {
  for (const [element, series] of cells) element.textContent = figure(series[record]);
}

let bars = []; // a histogram: { kind, heights, caption }

function buildHistograms() {
  const box = byId('histograms');
  box.replaceChildren();
  const ofVcpu = (kind) => kind.name.startsWith('vcpu.');
  const kinds = [...shown.details.histograms].sort((a, b) => ofVcpu(a) - ofVcpu(b));
  bars = kinds.map((kind) => {
    const heights = kind.limits.map(() => make('i'));
    const small = make('small');
    const chart = make('div', { class: 'bars', 'aria-hidden': 'true' }, ...heights);
    const words = make('span', { class: 'unseen' });
    box.append(make('div', { class: 'histogram' }, make('h3', {}, kind.name, ' ', small), chart,
      make('div', { class: 'limits', 'aria-hidden': 'true' }, make('span', {}, short(kind.limits[0])),
        make('span', {}, `> ${short(kind.limits[Math.max(0, kind.limits.length - 2)])}`)), words));
    return { kind, heights, small, words };
  });
  byId('histogram-box').hidden = bars.length === 0;
}

function showHistograms(record) {
  for (const { kind, heights, small, words } of bars) {
    const { count, mean, values } = kind.at(record);
    const top = Math.max(1e-9, ...values.map((value) => value ?? 0));
    small.textContent = count === null ? 'missing' : `n ${short(count)} mean ${short(mean)}`;
    const unit = kind.percent ? ' %' : '';
    values.forEach((value, i) => {
      heights[i].style.height = `${Math.max(0, value ?? 0) / top * 100}%`;
      heights[i].title = `up to ${figure(kind.limits[i])}: ${figure(value)}${unit}`;
    });
    words.textContent = values.map((value, i) => `${kind.limits[i]}: ${figure(value)}${unit}`).join(', ');
  }
}

let speaking = 0;

function speak() {
  clearTimeout(speaking);
  speaking = setTimeout(() => {
    const at = (key) => shown.data.get(key)?.[state.record];
    byId('live').textContent = `${portName(state.port)}, ${clock(TIMES[state.record])}: `
      + ['rxeps', 'txeps', 'ready', 'cstp', 'rxpps', 'txpps'].map((key) => `${key} ${figure(at(key))}`).join(', ');
  }, 300);
}
