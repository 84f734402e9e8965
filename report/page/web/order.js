// What the map shows of a port, and the order of its rows: the worst of the span in view first.

const FIGURES = {
  loss: { word: 'dropped packets/s', keys: ['rxeps', 'txeps'], steps: (largest) => decades(largest) },
  ready: { word: '% of the time, worst vcpu ready', keys: ['ready'], steps: () => [1, 2, 5, 10] },
  packets: { word: 'packets/s', keys: ['rxpps', 'txpps'], steps: (largest) => decades(largest) },
};
const loaded = new Map(); // columns of all ports that are decoded

async function loadFigure(figure) {
  for (const key of FIGURES[figure].keys) loaded.set(key, await portColumn(key));
  const values = new Float64Array(RECORDS);
  let top = 0;
  for (let port = 0; port < PORTS; port++) {
    fillPort(figure, port, values);
    for (let record = 0; record < RECORDS; record++) if (values[record] > top) top = values[record];
  }
  FIGURES[figure].thresholds = FIGURES[figure].steps(top);
}

// The figure of a port at each record: the sum of its keys. NaN where one is missing and no other tells of anything:
// half of a loss is a loss, but half of nothing is not nothing.
function fillPort(figure, port, values) {
  values.fill(0);
  const known = FIGURES[figure].keys.map((key) => loaded.get(key)).filter(Boolean);
  for (let record = 0; record < RECORDS; record++) {
    let missing = known.length === 0;
    for (const column of known) {
      const place = column.place[port];
      const code = place < 0 ? column.fixed[port] : column.values[place + record];
      if (code === MISSING) missing = true;
      else values[record] += code / column.scale;
    }
    if (missing && !(values[record] > 0)) values[record] = NaN;
  }
}

// A switch at each record: the worst of its ports.
function fillSwitch(figure, wanted, values) {
  const one = new Float64Array(RECORDS);
  values.fill(NaN);
  for (let port = 0; port < PORTS; port++) {
    if (manifest.ports.switch[port] !== wanted) continue;
    fillPort(figure, port, one);
    for (let record = 0; record < RECORDS; record++) {
      if (!(one[record] <= values[record]) && !Number.isNaN(one[record])) values[record] = one[record];
    }
  }
}

// Over the records in view: sum of value x seconds, or the worst value.
function overSpan(key, port, first, last, worst) {
  const column = loaded.get(key);
  if (!column) return null;
  let result = null;
  for (let record = first; record <= last; record++) {
    const value = valueAt(column, port, record);
    if (value === null) continue;
    if (worst) result = result === null ? value : Math.max(result, value);
    else result = (result ?? 0) + value * (TIMES[record] - STARTS[record]);
  }
  return result;
}

const plus = (a, b) => (a === null && b === null ? null : (a ?? 0) + (b ?? 0));
const SORT_BY = {
  loss: (port, first, last) => plus(overSpan('rxeps', port, first, last), overSpan('txeps', port, first, last)),
  ready: (port, first, last) => overSpan('ready', port, first, last, true),
  cstp: (port, first, last) => overSpan('cstp', port, first, last, true),
  packets: (port, first, last) => plus(overSpan('rxpps', port, first, last), overSpan('txpps', port, first, last)),
};

function searched() {
  const words = state.query.toLowerCase().split(/\s+/).filter(Boolean);
  const ports = [];
  for (let port = 0; port < PORTS; port++) {
    const text = `${portName(port)} ${portId(port)} ${portSwitch(port)} ${manifest.ports.mac[port]}`.toLowerCase();
    if (words.every((word) => text.includes(word))) ports.push(port);
  }
  return ports;
}

// Ports that the search leaves, in the order chosen; ties keep the order of the report.
function orderedPorts() {
  const ports = searched();
  if (state.sort === 'name') return ports.sort((a, b) => portName(a).localeCompare(portName(b), 'en', { numeric: true }));
  if (state.sort === 'id') return ports.sort((a, b) => Number(portId(a)) - Number(portId(b)));
  const [first, last] = recordsIn(state.from, state.to);
  const weights = new Float64Array(PORTS);
  for (const port of ports) weights[port] = SORT_BY[state.sort](port, first, last) ?? -1;
  return ports.sort((a, b) => weights[b] - weights[a]);
}
