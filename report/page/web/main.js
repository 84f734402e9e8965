// Start: the worst port and its worst record, or what the address says. `lanReport` is for people at the console.

async function start() {
  if (PORTS === 0) return; // the plain page says all there is
  if (manifest.compressed && typeof DecompressionStream === 'undefined') {
    throw new Error('this browser can\'t unpack it; lan-report page --no-compress makes one that it can');
  }
  document.documentElement.classList.add('js');
  createPlots(byId('plots'));
  const worst = manifest.worst[0] ?? 0;
  await Promise.all(['rxeps', 'txeps'].map(async (key) => loaded.set(key, await portColumn(key))));
  await loadFigure('loss');
  state.port = worst;
  state.record = worstRecord(worst);
  await createMaps();
  listen();
  readHash();
  showAxis();
  await needOrder();
  await loadPort();
  api.drawn = performance.now();
}

function worstRecord(port) {
  const values = new Float64Array(RECORDS);
  fillPort('loss', port, values);
  let worst = LAST;
  for (let record = LAST; record >= 0; record--) if (values[record] > 0 && !(values[record] < values[worst])) worst = record;
  return worst;
}

// By id as text: the series of a key, null where the report has none.
const api = {
  manifest, state, drawn: 0,
  series: async (id, key) => {
    const port = manifest.ports.id.indexOf(String(id));
    return port < 0 ? null : (await portData(port)).data.get(key) ?? null;
  },
  histograms: async (id) => (await portDetails(manifest.ports.id.indexOf(String(id)))).histograms,
  pcpu: async (row, key) => seriesOf(await pcpuColumn(key), row),
};
window.lanReport = api;
api.ready = start();
api.ready.catch((error) => {
  document.documentElement.classList.remove('js'); // the plain page is better than half of the other one
  document.querySelector('header').append(make('p', {}, `No plots: ${error.message}.`));
});
