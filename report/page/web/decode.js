// The data of the page: a manifest in JSON, and columns as base64 of gzip of four byte planes of int32 differences.

const MISSING = -0x80000000; // in a decoded column; no value of the report has this code

const manifest = JSON.parse(document.getElementById('manifest').textContent);
const TIMES = manifest.times;
const RECORDS = TIMES.length;
const PORTS = manifest.ports.name.length;

async function blockBytes(id) {
  const element = document.getElementById(id);
  const text = atob(element.textContent);
  element.remove(); // decoded once; the text is megabytes
  const bytes = new Uint8Array(text.length);
  for (let i = 0; i < text.length; i++) bytes[i] = text.charCodeAt(i);
  if (!manifest.compressed) return bytes;
  const stream = new Blob([bytes]).stream().pipeThrough(new DecompressionStream('gzip'));
  return new Uint8Array(await new Response(stream).arrayBuffer());
}

// Series of `length` values each, one after the other: planes to differences to values. A missing value is no step.
function undoDeltas(bytes, length) {
  const count = bytes.length / 4;
  const values = new Int32Array(count);
  for (let start = 0; start < count; start += length) {
    let last = 0;
    for (let i = start; i < start + length; i++) {
      const code = (bytes[i] | bytes[count + i] << 8 | bytes[2 * count + i] << 16 | bytes[3 * count + i] << 24) >>> 0;
      if (code === 0xffffffff) {
        values[i] = MISSING;
      } else {
        last += (code >>> 1) ^ -(code & 1);
        values[i] = last;
      }
    }
  }
  return values;
}

// A column of many rows (ports or pcpus): rows that change have their place in `values`, all others one fixed value.
async function decodeColumn(description, rows) {
  const column = { key: description.key, unit: description.unit, scale: description.scale };
  column.place = new Int32Array(rows);
  column.fixed = new Int32Array(rows);
  for (const [first, count, value] of description.fixed) {
    column.place.fill(-1, first, first + count);
    column.fixed.fill(value === null ? MISSING : value, first, first + count);
  }
  let next = 0;
  for (let row = 0; row < rows; row++) {
    if (column.place[row] === 0) column.place[row] = next++ * RECORDS;
  }
  column.values = description.block ? undoDeltas(await blockBytes(description.block), RECORDS) : new Int32Array(0);
  return column;
}

function codeAt(column, row, record) {
  const place = column.place[row];
  return place < 0 ? column.fixed[row] : column.values[place + record];
}

function valueAt(column, row, record) {
  const code = codeAt(column, row, record);
  return code === MISSING ? null : code / column.scale;
}

function seriesOf(column, row) {
  return Array.from({ length: RECORDS }, (_, record) => valueAt(column, row, record));
}

const columnsByKey = new Map(manifest.columns.map((column) => [column.key, column]));
const pcpuColumns = new Map(manifest.pcpus.columns.map((column) => [column.key, column]));
const decoded = new Map();

// The promise of a column of all ports, decoded on its first use; null when the page has none of that key.
function portColumn(key) {
  if (!columnsByKey.has(key)) return Promise.resolve(null);
  if (!decoded.has(key)) decoded.set(key, decodeColumn(columnsByKey.get(key), PORTS));
  return decoded.get(key);
}

function pcpuColumn(key) {
  if (!pcpuColumns.has(key)) return Promise.resolve(null);
  if (!decoded.has(key)) decoded.set(key, decodeColumn(pcpuColumns.get(key), manifest.pcpus.count));
  return decoded.get(key);
}

// What only some ports have: a map from key to series, decoded when the port is chosen. What moves comes first.
async function decodeDetails(details) {
  const series = new Map();
  if (details.block) {
    const values = undoDeltas(await blockBytes(details.block), RECORDS);
    details.columns.forEach(([key, scale], place) => {
      const part = values.subarray(place * RECORDS, (place + 1) * RECORDS);
      series.set(key, Array.from(part, (code) => (code === MISSING ? null : code / scale)));
    });
  }
  for (const [key, scale, value] of details.fixed) series.set(key, new Array(RECORDS).fill(value / scale));
  return series;
}

// Histograms of a port: for each its limits and, a row a record, [count, mean, shares or counts of the buckets].
async function decodeHistograms(histograms) {
  const values = undoDeltas(await blockBytes(histograms.block), RECORDS);
  let place = 0;
  return histograms.kinds.map(({ name, scale, limits }) => {
    const rows = limits.length + 2;
    const start = place;
    place += rows * RECORDS;
    const at = (row, record) => {
      const code = values[start + row * RECORDS + record];
      return code === MISSING ? null : row < 2 ? code : code / scale;
    };
    return {
      name, limits, percent: scale > 1,
      at: (record) => ({ count: at(0, record), mean: at(1, record), values: limits.map((_, i) => at(i + 2, record)) }),
    };
  });
}

const detailsOfPort = new Map();

function portDetails(port) {
  const details = manifest.details[port];
  if (!details) return Promise.resolve({ series: new Map(), texts: {}, histograms: [], none: true });
  if (!detailsOfPort.has(port)) {
    detailsOfPort.set(port, (async () => ({
      series: await decodeDetails(details),
      texts: details.texts,
      histograms: details.histograms ? await decodeHistograms(details.histograms) : [],
    }))());
  }
  return detailsOfPort.get(port);
}
