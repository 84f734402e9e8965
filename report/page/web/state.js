// What is shown: the port, the span, the chosen record, figure and order of the map, the search. It stands in the
// address behind the #, so that a view can be mailed. `change` is the only way to alter it.

const FIRST_TIME = STARTS[0];
const LAST_TIME = TIMES[LAST];
const VIEWS = ['loss', 'ready', 'packets', 'table'];
const ORDERS = ['loss', 'ready', 'cstp', 'packets', 'name', 'id'];

const state = { port: 0, record: 0, from: FIRST_TIME, to: LAST_TIME, view: 'loss', sort: 'loss', query: '' };
const listeners = [];

// A listener hears of the keys that it names, or of all.
function onChange(keys, listener) {
  listeners.push({ keys, listener });
}

function change(wanted) {
  const changed = Object.keys(wanted).filter((key) => state[key] !== wanted[key]);
  if (changed.length === 0) return;
  Object.assign(state, wanted);
  for (const { keys, listener } of listeners) {
    if (keys.some((key) => changed.includes(key))) listener(changed);
  }
  writeHash();
}

function setSpan(from, to) {
  const least = Math.min(STEP, LAST_TIME - FIRST_TIME);
  from = Math.max(FIRST_TIME, Math.min(from, LAST_TIME - least));
  to = Math.min(LAST_TIME, Math.max(to, from + least));
  const [first, last] = recordsIn(from, to);
  change({ from, to, record: Math.min(Math.max(state.record, first), last) });
}

const resetSpan = () => setSpan(FIRST_TIME, LAST_TIME);

function zoom(factor) {
  const middle = Math.min(Math.max(TIMES[state.record], state.from), state.to);
  const width = Math.min((state.to - state.from) * factor, LAST_TIME - FIRST_TIME);
  const from = Math.min(Math.max(middle - width / 2, FIRST_TIME), LAST_TIME - width);
  setSpan(from, from + width);
}

let written = '';
let writing = 0;

function writeHash() {
  clearTimeout(writing);
  writing = setTimeout(() => {
    const parts = new URLSearchParams({ port: portId(state.port) ?? '', at: TIMES[state.record] });
    if (state.from !== FIRST_TIME || state.to !== LAST_TIME) {
      parts.set('from', state.from);
      parts.set('to', state.to);
    }
    parts.set('view', state.view);
    parts.set('sort', state.sort);
    if (state.query) parts.set('q', state.query);
    written = `#${parts}`;
    if (location.hash !== written) location.replace(written);
  }, 150);
}

// Takes what is there and right; the rest stays as it was.
function readHash() {
  if (location.hash === written && written !== '') return;
  const parts = new URLSearchParams(location.hash.slice(1));
  const wanted = {};
  const port = manifest.ports.id.indexOf(parts.get('port'));
  if (port >= 0) wanted.port = port;
  const number = (name) => (parts.has(name) ? Number(parts.get(name)) : NaN);
  if (VIEWS.includes(parts.get('view'))) wanted.view = parts.get('view');
  if (ORDERS.includes(parts.get('sort'))) wanted.sort = parts.get('sort');
  if (parts.has('q')) wanted.query = parts.get('q');
  if (Number.isFinite(number('at'))) {
    wanted.record = recordAt(number('at'));
    if (TIMES[wanted.record] < state.from || STARTS[wanted.record] > state.to) resetSpan();
  }
  change(wanted);
  if (number('from') < number('to')) setSpan(number('from'), number('to'));
}
