// Rows over time on a canvas of our own: each pixel column shows the worst record that it stands for, so that no zoom
// hides a peak. Only visible rows are drawn. What is missing is left clear: the hatched ground shows through.

const PALETTE = ['#00204C', '#5B5F6D', '#838178', '#B0A572', '#E1CC5C', '#FFE945'];
const PIXELS = new Uint32Array(PALETTE.map((colour) => {
  const [red, green, blue] = [1, 3, 5].map((at) => parseInt(colour.slice(at, at + 2), 16));
  return (0xff << 24 | blue << 16 | green << 8 | red) >>> 0; // canvas bytes are RGBA, and all our readers little-endian
}));

function levelOf(value, steps) {
  if (!(value > 0)) return 0;
  let level = 1;
  while (level < 5 && value >= steps[level - 1]) level++;
  return level;
}

// Five steps below the largest value, each a decade: the smallest loss shows, the worst glares.
function decades(largest) {
  const top = 10 ** Math.floor(Math.log10(largest > 0 ? largest : 1));
  return [top / 1000, top / 100, top / 10, top];
}

// For each pixel of the width the first and last record whose spans it touches; first > last: none.
function pixelRecords(width) {
  const first = new Int32Array(width);
  const last = new Int32Array(width);
  const scale = (state.to - state.from) / width;
  let record = 0;
  for (let x = 0; x < width; x++) {
    const from = state.from + x * scale;
    while (record < LAST && TIMES[record] <= from) record++;
    first[x] = record;
    let end = record;
    while (end < LAST && STARTS[end + 1] < from + scale && TIMES[end] < from + scale) end++;
    if (STARTS[end] >= from + scale || TIMES[end] <= from) end = first[x] - 1;
    last[x] = end;
  }
  return { first, last };
}

// options: box (element), label (its name for screen readers), rowHeight, rowText(row) -> [name, small print],
// fill(row, values): the row's value at each record, NaN where missing; steps(), pick(row, record), hover(record).
function createMap(options) {
  const labels = make('div', { class: 'map-labels' });
  const canvas = make('canvas', { 'aria-hidden': 'true' });
  const line = make('div', { class: 'map-line' });
  const range = make('div', { class: 'map-range', hidden: true });
  const cells = make('div', { class: 'map-cells' }, canvas, line, range);
  const view = make('div', { class: 'map-view' }, labels, cells);
  const space = make('div', { class: 'map-space' }, view);
  const scroll = make('div', { class: 'map-scroll', tabindex: '0', role: 'listbox', 'aria-label': options.label }, space);
  options.box.append(scroll);
  const map = { rows: [], selected: -1, scroll };
  const values = new Float64Array(RECORDS);
  const height = options.rowHeight;
  let top = 0;

  function visibleRows() {
    return Math.min(map.rows.length - top, Math.max(1, Math.ceil(scroll.clientHeight / height)));
  }

  function drawLabels(count) {
    while (labels.children.length > count) labels.lastChild.remove();
    while (labels.children.length < count) {
      labels.append(make('div', { class: 'map-label', role: 'option' }, make('b'), make('small')));
    }
    for (let i = 0; i < count; i++) {
      const row = map.rows[top + i];
      const [name, small] = options.rowText(row);
      const label = labels.children[i];
      label.id = `${options.box.id}-row-${row}`;
      label.title = `${name} ${small}`;
      label.firstChild.textContent = name;
      label.lastChild.textContent = small;
      label.setAttribute('aria-selected', row === map.selected);
      label.setAttribute('aria-posinset', top + i + 1);
      label.setAttribute('aria-setsize', map.rows.length);
      if (row === map.selected) scroll.setAttribute('aria-activedescendant', label.id);
    }
  }

  function drawCells(count) {
    const ratio = window.devicePixelRatio || 1;
    const width = Math.max(1, Math.round(cells.clientWidth * ratio));
    canvas.width = width;
    canvas.height = Math.round(count * height * ratio);
    canvas.style.height = `${count * height}px`;
    if (count === 0) return;
    const { first, last } = pixelRecords(width);
    const image = new ImageData(width, count);
    const pixels = new Uint32Array(image.data.buffer);
    const steps = options.steps();
    for (let i = 0; i < count; i++) {
      options.fill(map.rows[top + i], values);
      for (let x = 0; x < width; x++) {
        let worst = NaN;
        for (let record = first[x]; record <= last[x]; record++) {
          if (!(values[record] <= worst) && !Number.isNaN(values[record])) worst = values[record];
        }
        if (!Number.isNaN(worst)) pixels[i * width + x] = PIXELS[levelOf(worst, steps)];
      }
    }
    const small = make('canvas');
    small.width = width;
    small.height = count;
    small.getContext('2d').putImageData(image, 0, 0);
    const context = canvas.getContext('2d');
    context.imageSmoothingEnabled = false;
    context.drawImage(small, 0, 0, canvas.width, canvas.height);
    const gap = Math.max(1, Math.round(ratio));
    context.fillStyle = getComputedStyle(document.documentElement).getPropertyValue('--panel');
    for (let i = 1; i <= count; i++) context.fillRect(0, Math.round(i * height * ratio) - gap, width, gap);
  }

  map.draw = () => {
    space.style.height = `${map.rows.length * height}px`;
    top = Math.max(0, Math.min(Math.round(scroll.scrollTop / height), map.rows.length - 1));
    const count = map.rows.length ? visibleRows() : 0;
    view.style.height = `${Math.min(scroll.clientHeight, count * height)}px`;
    drawLabels(count);
    drawCells(count);
  };

  map.setRows = (rows) => {
    map.rows = rows;
    map.draw();
  };

  map.select = (row) => {
    map.selected = row;
    const at = map.rows.indexOf(row);
    if (at >= 0) {
      const shown = Math.floor(scroll.clientHeight / height);
      if (at < top) scroll.scrollTop = at * height;
      else if (at >= top + shown) scroll.scrollTop = (at - shown + 1) * height;
    }
    map.draw();
  };

  map.cursor = (record) => {
    const time = (TIMES[record] + STARTS[record]) / 2;
    const part = (time - state.from) / (state.to - state.from);
    line.hidden = !(part >= 0 && part <= 1);
    line.style.left = `${part * 100}%`;
  };

  const timeAt = (event) => {
    const box = cells.getBoundingClientRect();
    const part = Math.min(Math.max((event.clientX - box.left) / box.width, 0), 1);
    return state.from + part * (state.to - state.from);
  };
  const rowAt = (event) => map.rows[top + Math.floor((event.clientY - view.getBoundingClientRect().top) / height)];

  let start = null;
  cells.addEventListener('pointerdown', (event) => {
    if (event.button !== 0) return;
    start = { x: event.clientX, time: timeAt(event) };
    if (event.pointerType === 'mouse') cells.setPointerCapture(event.pointerId);
  });
  cells.addEventListener('pointermove', (event) => {
    const time = timeAt(event);
    options.hover(recordAt(time));
    if (start === null || Math.abs(event.clientX - start.x) < 6) return;
    const part = (t) => `${(t - state.from) / (state.to - state.from) * 100}%`;
    range.hidden = false;
    range.style.left = part(Math.min(time, start.time));
    range.style.right = `calc(100% - ${part(Math.max(time, start.time))})`;
  });
  cells.addEventListener('pointerup', (event) => {
    if (start === null) return;
    const { x, time } = start;
    start = null;
    range.hidden = true;
    if (Math.abs(event.clientX - x) >= 6) {
      setSpan(Math.min(time, timeAt(event)), Math.max(time, timeAt(event)));
    } else if (rowAt(event) !== undefined) {
      options.pick(rowAt(event), recordAt(timeAt(event)));
    }
  });
  cells.addEventListener('pointercancel', () => { start = null; range.hidden = true; });
  cells.addEventListener('pointerleave', () => options.hover(null));
  cells.addEventListener('dblclick', resetSpan);
  labels.addEventListener('click', (event) => {
    const row = rowAt(event);
    if (row !== undefined) options.pick(row, state.record);
  });
  let pending = false;
  scroll.addEventListener('scroll', () => {
    if (pending) return;
    pending = true;
    requestAnimationFrame(() => { pending = false; map.draw(); });
  }, { passive: true });
  new ResizeObserver(() => map.draw()).observe(scroll);
  return map;
}
