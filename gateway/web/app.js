// The live page of `maroset serve`: nodes and their links, the tag table, a trend of the
// selected tag and the latest driver errors, kept current from the event stream.
'use strict';

const TREND_SECONDS = 300;
const TREND_POINTS = 300;   // per tag; a tag that changes faster shows a shorter window
const ERRORS_KEPT = 50;
const NODES_REFRESH_MS = 5000;
const LIT_MS = 1000;         // how long a changed value stays highlighted

const $ = (id) => document.getElementById(id);
const keyOf = (node, handle) => node + '\u0000' + handle;

const rows = new Map();      // tag key -> row record, in table order
const pending = new Map();   // tag key -> latest {value, time} not yet on screen
const nodes = new Map();     // node name -> its list element
const lit = new Map();       // row record -> when its highlight goes out
let putOutTimer = 0;
let frameRequested = false;
let tagsLoaded = false;
let selected = null;         // row record shown in the trend
let trendDirty = false;
let writes = 'unknown';      // 'yes', 'no' or 'unknown' until the service says
let token = sessionStorage.getItem('maroset-token') || '';

function text(tag, content, className) {
  const el = document.createElement(tag);
  if (content !== undefined) el.textContent = content;
  if (className) el.className = className;
  return el;
}

function shown(value) {
  if (value === null) return 'Null';
  if (value === true) return 'True';
  if (value === false) return 'False';
  if (typeof value === 'object') return JSON.stringify(value);
  return String(value);
}

// A batch of changes shares one time, and formatting it is the dearest part of a row.
let clockIso = '';
let clockText = '';
function clock(iso) {
  if (!iso) return '';
  if (iso !== clockIso) {
    const t = new Date(iso);
    clockIso = iso;
    clockText = isNaN(t) ? iso : t.toLocaleTimeString();
  }
  return clockText;
}

// The number a trend draws for a value: devices that speak text (the soft PLC) report
// numbers as text, and those are drawn too.
const NUMBER_TEXT = /^\s*[-+]?(\d+\.?\d*|\.\d+)([eE][-+]?\d+)?\s*$/;
function numeric(value) {
  if (typeof value === 'number') return value;
  if (typeof value === 'boolean') return value ? 1 : 0;
  if (typeof value === 'string' && NUMBER_TEXT.test(value)) return Number(value);
  return null;
}

async function getJson(path) {
  const response = await fetch(path, { cache: 'no-store' });
  if (!response.ok) throw new Error(path + ': ' + response.status);
  return response.json();
}

// ---- nodes ----------------------------------------------------------------------------

function renderNode(n) {
  let li = nodes.get(n.name);
  if (!li) {
    li = text('li', undefined, 'node');
    li.dataset.node = n.name;
    li.append(text('span', n.name, 'node-name'), text('span', n.driver || '', 'muted'),
              text('span', '', 'state'), text('div', '', 'counters'), text('div', '', 'last'));
    nodes.set(n.name, li);
    $('nodes').append(li);
  }
  const link = n.link || {};
  setLink(li, link.state || 'unknown', link.since);
  const counters = link.counters || {};
  // Only what has happened: a row of zeros hides the one counter that moved.
  li.querySelector('.counters').textContent =
      Object.entries(counters).filter(([, v]) => v).map(([k, v]) => k + ' ' + v).join(' · ');
  const last = link.last && link.last.text ? clock(link.last.time) + ' ' + link.last.text : '';
  li.querySelector('.last').textContent = last;
}

function setLink(li, state, since) {
  li.dataset.link = state;
  li.querySelector('.state').textContent = since ? state + ' since ' + clock(since) : state;
}

async function refreshNodes() {
  try {
    for (const n of await getJson('/api/nodes')) renderNode(n);
  } catch (e) { /* the stream's state already tells the service is away */ }
}

// ---- tags -----------------------------------------------------------------------------

function cell(content, className) {
  const el = text('span', content, className);
  el.setAttribute('role', 'cell');
  return el;
}

// Rows are grids of their own rather than a table's, so a changed value lays out its row
// alone, and rows out of sight are skipped by the browser altogether.
function buildRow(tag) {
  const tr = document.createElement('div');
  tr.className = 'row';
  tr.setAttribute('role', 'row');
  tr.dataset.node = tag.node;
  tr.dataset.handle = tag.handle;
  const name = cell(undefined, 'name');
  name.append(text('span', tag.node, 'muted node-inline'), text('span', tag.name || tag.address),
              tag.name && tag.name !== tag.address ? text('span', tag.address, 'muted addr') : '');
  const value = cell(shown(tag.value), 'num value');
  value.dataset.role = 'value';
  const time = cell(clock(tag.time), 'time');
  const changes = cell(String(tag.changes || 0), 'opt num');
  // No <form> per row: Chromium takes time quadratic in their number to build ten thousand.
  const box = text('div', undefined, 'write');
  const input = document.createElement('input');
  input.setAttribute('aria-label', 'new value of ' + (tag.name || tag.address));
  box.append(input, text('button', 'Set'));
  const writeCell = cell(undefined, 'write-col');
  writeCell.append(box);
  tr.append(cell(tag.node, 'node-col'), name, value, cell(tag.type || '', 'opt type'), time,
            changes, writeCell);
  const row = {
    tag, tr, value, time, changes,
    search: (tag.node + ' ' + tag.name + ' ' + tag.address).toLowerCase(),
    trend: null, trendAt: 0, trendSize: 0,
  };
  record(row, tag.value);
  return row;
}

function loadTags(list) {
  const body = $('tags');
  const fresh = new Map();
  const fragment = document.createDocumentFragment();
  for (const tag of list) {
    const key = keyOf(tag.node, tag.handle);
    // A change the table already holds is not counted a second time.
    const change = pending.get(key);
    if (change && tag.time && change.time <= tag.time) pending.delete(key);
    let row = rows.get(key);
    if (row) {
      row.tag.changes = tag.changes;
      row.tag.type = tag.type;
      show(row, tag.value, tag.time, tag.changes, false);
    } else {
      row = buildRow(tag);
    }
    fresh.set(key, row);
    fragment.append(row.tr);
  }
  body.replaceChildren(fragment);
  rows.clear();
  for (const [k, v] of fresh) rows.set(k, v);
  $('tag-count').textContent = rows.size + (rows.size === 1 ? ' tag' : ' tags');
  tagsLoaded = true;
  applyFilter();
  if (!selected || !rows.has(keyOf(selected.tag.node, selected.tag.handle))) {
    select([...rows.values()].find((r) => numeric(r.tag.value) !== null) || null);
  }
  schedule();
}

function show(row, value, time, changes, highlight) {
  row.tag.value = value;
  row.tag.time = time;
  row.value.textContent = shown(value);
  row.time.textContent = clock(time);
  row.changes.textContent = String(changes);
  if (highlight) {
    // A plain class rather than an animation: thousands of cells animating at once cost
    // far more than lighting them and putting them out a second later.
    lit.delete(row);
    lit.set(row, performance.now() + LIT_MS);
    row.value.classList.add('lit');
  }
}

// Puts out the cells lit longest ago; the map keeps them in the order they were lit.
function putOut() {
  const now = performance.now();
  for (const [row, until] of lit) {
    if (until > now) {
      if (!putOutTimer) putOutTimer = setTimeout(() => { putOutTimer = 0; schedule(); }, until - now);
      return;
    }
    row.value.classList.remove('lit');
    lit.delete(row);
  }
}

// Keeps the trend samples of a numeric tag in a ring: time in seconds since the page
// loaded and value, in single precision (ten thousand tags take some 24 MB). Times
// are those of arrival, so a service whose clock differs from the browser's draws right.
const epoch = Date.now();
function record(row, value) {
  const v = numeric(value);
  if (v === null) return;
  if (!row.trend) row.trend = new Float32Array(TREND_POINTS * 2);
  row.trend[row.trendAt * 2] = (Date.now() - epoch) / 1000;
  row.trend[row.trendAt * 2 + 1] = v;
  row.trendAt = (row.trendAt + 1) % TREND_POINTS;
  row.trendSize = Math.min(row.trendSize + 1, TREND_POINTS);
  if (row === selected) trendDirty = true;
}

function onValues(batch) {
  for (const change of batch) {
    const key = keyOf(change.node, change.handle);
    const before = pending.get(key);
    pending.set(key, { value: change.value, time: change.time, count: before ? before.count + 1 : 1 });
    const row = rows.get(key);
    if (row) record(row, change.value);
  }
  schedule();
}

function schedule() {
  if (frameRequested) return;
  frameRequested = true;
  requestAnimationFrame(frame);
}

// One DOM pass per frame, touching only the cells whose tag changed since the last one.
function frame() {
  frameRequested = false;
  if (tagsLoaded) {
    for (const [key, change] of pending) {
      const row = rows.get(key);
      if (!row) continue;
      row.tag.changes = (row.tag.changes || 0) + change.count;
      show(row, change.value, change.time, row.tag.changes, true);
    }
    pending.clear();
  }
  putOut();
  if (trendDirty) drawTrend();
}

function applyFilter() {
  const words = $('filter').value.trim().toLowerCase();
  for (const row of rows.values()) row.tr.hidden = words !== '' && !row.search.includes(words);
}

// ---- trend ----------------------------------------------------------------------------

function select(row) {
  if (selected) selected.tr.classList.remove('selected');
  selected = row;
  if (row) row.tr.classList.add('selected');
  $('trend-name').textContent = row ? row.tag.node + ' ' + (row.tag.name || row.tag.address)
                                    : 'select a numeric tag';
  drawTrend();
}

function drawTrend() {
  trendDirty = false;
  const line = $('trend-line');
  const row = selected;
  if (!row || !row.trend || row.trendSize === 0) {
    line.setAttribute('points', '');
    $('trend-max').textContent = $('trend-min').textContent = $('trend-span').textContent = '';
    return;
  }
  const now = (Date.now() - epoch) / 1000;
  const from = now - TREND_SECONDS;
  const times = [];
  const values = [];
  const first = (row.trendAt - row.trendSize + TREND_POINTS) % TREND_POINTS;
  for (let i = 0; i < row.trendSize; i++) {
    const at = ((first + i) % TREND_POINTS) * 2;
    if (row.trend[at] < from && i < row.trendSize - 1) continue;
    times.push(row.trend[at]);
    values.push(row.trend[at + 1]);
  }
  let min = Math.min(...values);
  let max = Math.max(...values);
  if (min === max) { min -= 1; max += 1; }
  const start = Math.max(from, times[0]);
  const x = (t) => ((Math.max(t, start) - start) / Math.max(now - start, 1)) * 600;
  const y = (v) => 150 - ((v - min) / (max - min)) * 140;
  // A step line: a value holds until the next change, and the last one holds until now.
  const points = [];
  for (let i = 0; i < values.length; i++) {
    if (i > 0) points.push(x(times[i]).toFixed(1) + ',' + y(values[i - 1]).toFixed(1));
    points.push(x(times[i]).toFixed(1) + ',' + y(values[i]).toFixed(1));
  }
  points.push('600,' + y(values[values.length - 1]).toFixed(1));
  line.setAttribute('points', points.join(' '));
  $('trend-max').textContent = String(+max.toPrecision(7));
  $('trend-min').textContent = String(+min.toPrecision(7));
  $('trend-span').textContent = 'last ' + Math.round((now - start) / 60 * 10) / 10 + ' min';
}

// ---- errors ---------------------------------------------------------------------------

function onError(e) {
  const li = text('li');
  li.append(text('time', new Date().toLocaleTimeString()), text('b', e.driver || ''),
            text('span', e.from || '', 'muted'), text('span', e.message || ''));
  const list = $('errors');
  list.prepend(li);
  while (list.children.length > ERRORS_KEPT) list.lastChild.remove();
}

// ---- writes ---------------------------------------------------------------------------

function setWrites(state, tokenNeeded) {
  writes = state;
  document.body.classList.toggle('writes', state !== 'no');
  if (tokenNeeded) $('token').hidden = false;
}

// What the operator typed, as the tag's kind takes it: text stays text for a String tag,
// otherwise numbers and True/False are sent as such.
function parsed(input, type) {
  if (type === 'String') return input;
  const t = input.trim();
  if (/^(true|false)$/i.test(t)) return t.toLowerCase() === 'true';
  if (t !== '' && !isNaN(Number(t))) return Number(t);
  return input;
}

async function write(row, input) {
  const status = $('write-status');
  const label = row.tag.node + ' ' + (row.tag.name || row.tag.address);
  const headers = { 'Content-Type': 'application/json' };
  if (token) headers.Authorization = 'Bearer ' + token;
  let answer = {};
  let code = 0;
  try {
    const response = await fetch('/api/tags/' + encodeURIComponent(row.tag.node) + '/' +
                                     encodeURIComponent(row.tag.handle),
                                 { method: 'POST', headers,
                                   body: JSON.stringify({ value: parsed(input.value, row.tag.type) }) });
    code = response.status;
    answer = await response.json().catch(() => ({}));
  } catch (e) {
    answer = { ok: false, error: { description: 'the service did not answer' } };
  }
  if (code === 401) setWrites(writes, true);
  if (code === 403) setWrites('no', false);
  if (answer.ok) {
    status.textContent = label + ': written';
    status.className = 'write-status ok';
    input.value = '';
  } else {
    // The library's refusal carries number and description, the service's status and message.
    const error = answer.error || {};
    status.textContent = label + ': ' + (error.number ? error.number + ' ' : '') +
                         (error.description || error.message || 'write refused (' + code + ')');
    status.className = 'write-status failed';
  }
}

// ---- the event stream -----------------------------------------------------------------

let source = null;
let retryMs = 1000;

function setStream(state) {
  const el = $('stream');
  el.dataset.state = state;
  el.textContent = state;
}

function connect() {
  source = new EventSource('/api/events');
  source.onopen = () => {
    retryMs = 1000;
    setStream('live');
    // Whatever changed while the stream was away comes in with a fresh table.
    getJson('/api/tags').then(loadTags).catch(() => {});
    refreshNodes();
  };
  source.addEventListener('values', (m) => onValues(JSON.parse(m.data)));
  source.addEventListener('link', (m) => {
    const change = JSON.parse(m.data);
    const li = nodes.get(change.node);
    if (li) setLink(li, change.state, new Date().toISOString());
    else refreshNodes();
  });
  // The stream's own "error" events (a driver's) share the name with a lost connection.
  source.addEventListener('error', (e) => {
    if (e instanceof MessageEvent) {
      onError(JSON.parse(e.data));
      return;
    }
    setStream('reconnecting');
    // The browser retries a dropped stream by itself, but gives up on a refused one.
    if (source.readyState === EventSource.CLOSED) {
      setTimeout(connect, retryMs);
      retryMs = Math.min(retryMs * 2, 15000);
    }
  });
}

function start() {
  $('filter').addEventListener('input', applyFilter);
  $('token').querySelector('input').value = token;
  $('token').addEventListener('input', (e) => {
    token = e.target.value;
    sessionStorage.setItem('maroset-token', token);
  });
  $('token').addEventListener('submit', (e) => e.preventDefault());
  const rowOf = (el) => {
    const tr = el.closest('.row');
    return tr && rows.get(keyOf(tr.dataset.node, tr.dataset.handle));
  };
  $('tags').addEventListener('keydown', (e) => {
    const row = e.key === 'Enter' && e.target.tagName === 'INPUT' && rowOf(e.target);
    if (row) write(row, e.target);
  });
  $('tags').addEventListener('click', (e) => {
    const row = rowOf(e.target);
    if (!row) return;
    if (e.target.tagName === 'BUTTON') write(row, e.target.previousElementSibling);
    else if (!e.target.closest('.write') && row.trend) select(row);
  });
  // A service that does not say whether it takes writes shows the boxes; its first refusal
  // takes them away (403) or asks for the token (401).
  getJson('/api/info')
      .then((info) => setWrites(info.writes ? 'yes' : 'no', info.writes && info.token))
      .catch(() => setWrites('unknown', false));
  setInterval(() => { if (!document.hidden) refreshNodes(); }, NODES_REFRESH_MS);
  setInterval(() => { if (selected) { trendDirty = true; schedule(); } }, 1000);
  connect();
}

start();
