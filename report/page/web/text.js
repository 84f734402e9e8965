// Words and numbers: how figures, times and names are written, and elements made of them. Texts of the report become
// text nodes and nothing else.

function make(tag, properties = {}, ...children) {
  const element = document.createElement(tag);
  for (const [name, value] of Object.entries(properties)) {
    if (name in element && typeof value !== 'string') element[name] = value;
    else if (value !== null) element.setAttribute(name, value);
  }
  element.append(...children);
  return element;
}

// What would turn or hide the text stands there as its code, as in findings: two names can't look alike.
const plain = (text) => text.replace(/[\u0000-\u001f\u007f-\u009f\u061c\u200e\u200f\u2028-\u202e\u2066-\u2069]/g, (sign) => {
  const code = sign.codePointAt(0);
  return code < 0x80 ? `\\x${code.toString(16).padStart(2, '0')}` : `\\u{${code.toString(16).padStart(4, '0')}}`;
});

const byId = (id) => document.getElementById(id);

// A figure as the report has it: at most two decimals, thousands apart.
function figure(value) {
  if (value === null || value === undefined) return '–';
  return value.toLocaleString('en-US', { maximumFractionDigits: 2 });
}

// Short, for axes and legends: 1.2k, 34M.
function short(value) {
  if (value === null || value === undefined) return '–';
  const size = Math.abs(value);
  for (const [limit, sign] of [[1e9, 'G'], [1e6, 'M'], [1e3, 'k']]) {
    if (size >= limit) return `${+(value / limit).toPrecision(3)}${sign}`;
  }
  return String(+value.toPrecision(size >= 100 ? 4 : 3));
}

const iso = (time) => new Date(time * 1000).toISOString();
const day = (time) => iso(time).slice(0, 10);
// With fractions only where two records stand in one second.
const clock = (time) => iso(time).slice(11, Number.isInteger(time) ? 19 : 23);

const LAST = RECORDS - 1;
const steps = TIMES.slice(1).map((time, i) => time - TIMES[i]).sort((a, b) => a - b);
const STEP = (RECORDS > 1 ? steps[steps.length >> 1] : manifest.interval) || 1;
// A record speaks for the span that ends with it; behind a gap, for one usual interval.
const STARTS = TIMES.map((time, i) => (i > 0 && time - TIMES[i - 1] <= 1.5 * STEP ? TIMES[i - 1] : time - STEP));

const portName = (port) => plain(manifest.ports.name[port]);
const portId = (port) => manifest.ports.id[port];
const portSwitch = (port) => plain(manifest.ports.switches[manifest.ports.switch[port]]);

function recordAt(time) {
  let low = 0;
  let high = LAST;
  while (low < high) {
    const middle = (low + high) >> 1;
    if (TIMES[middle] < time) low = middle + 1;
    else high = middle;
  }
  return low;
}

// The records whose spans lie in the view: [first, last].
function recordsIn(from, to) {
  let first = recordAt(from);
  let last = recordAt(to);
  if (first < LAST && TIMES[first] <= from && first < last) first++;
  if (STARTS[last] >= to && last > first) last--;
  return [first, last];
}

function csvCell(value) {
  if (value === null || value === undefined) return '';
  const text = String(value);
  return /[",\r\n]/.test(text) ? `"${text.replaceAll('"', '""')}"` : text;
}

const csvText = (rows) => rows.map((row) => row.map(csvCell).join(',')).join('\r\n') + '\r\n';

function saveFile(name, text) {
  const link = make('a', { href: URL.createObjectURL(new Blob([text], { type: 'text/csv' })), download: name });
  link.click();
  setTimeout(() => URL.revokeObjectURL(link.href), 1000);
}
