// SPDX-License-Identifier: Apache-2.0
// Draws the report from the object in the page. All text of a medium goes through textContent or
// an attribute's value, never through markup.
'use strict';
(function () {
// Names come byte by byte, each as the code point of its number: those in UTF-8 become it again.
const utf8 = new TextDecoder('utf-8', {fatal: true, ignoreBOM: true});
function readable(text) {
    try {
        return /[\x80-\xff]/.test(text)
            ? utf8.decode(Uint8Array.from(text, (c) => c.charCodeAt(0))) : text;
    } catch (error) {
        return text;
    }
}
const data = JSON.parse(document.getElementById('data').textContent,
    (key, value) => typeof value === 'string' ? readable(value) : value);
const byId = (id) => document.getElementById(id);
const SVG = 'http://www.w3.org/2000/svg';

function node(parent, tag, attributes, text) {
    const ours = parent.namespaceURI === SVG || tag === 'svg';
    const made = ours ? document.createElementNS(SVG, tag) : document.createElement(tag);
    for (const [name, value] of Object.entries(attributes || {})) {
        made.setAttribute(name, value);
    }
    if (text !== undefined) {
        made.textContent = text;
    }
    return parent.appendChild(made);
}

// How many are left out of a list.
function noteMore(parent, count) {
    if (count) {
        node(parent, 'p', {class: 'note'}, 'and ' + number(count) + ' more');
    }
}

const number = (n) => n === null || n === undefined ? '-' : n.toLocaleString('en-US');
// The local time of a handset is read and written as if it were UTC: no zone of the reader counts.
// A name may give a second 60 or a day 31 of any month, which only a sum takes. NaN without a time.
function seconds(text) {
    const [, year, month, day, hour, minute, second] =
        /^(\d+)-(\d+)-(\d+) (\d+):(\d+):(\d+)$/.exec(text) || [];
    return new Date(0).setUTCFullYear(year, month - 1, day) / 1000 +
        hour * 3600 + minute * 60 + Number(second);
}
const clock = (s) => new Date(s * 1000).toISOString().slice(0, 19).replace('T', ' ');
const scaled = (n, unit) => n >= 1e6 ? (n / 1e6).toFixed(1) + ' M' + unit
    : n >= 1e3 ? (n / 1e3).toFixed(1) + ' k' + unit : n + ' ' + unit;
const rounded = (n) => n.toLocaleString('en-US', {maximumSignificantDigits: 4});

// ---- the head
byId('roots').textContent = data.roots.join('  ');
byId('made').textContent = 'Made by kestlog ' + data.version + '.';
document.title = 'Device logs ' + data.from;
const TOTALS = [['sets', 'sets'], ['cps', 'co-processors'], ['files', 'files'], ['size', 'bytes'],
    ['damages', 'damages'], ['notes', 'notes'], ['unreadable', 'unreadable']];
for (const [key, name] of TOTALS) {
    const pair = node(byId('totals'), 'div');
    node(pair, 'dt', {}, name);
    const bad = (key === 'damages' || key === 'unreadable') && data.totals[key];
    node(pair, 'dd', {id: 'total-' + key, class: bad ? 'bad' : ''}, number(data.totals[key]));
}
for (const [key, name] of [['from', 'first'], ['to', 'last']]) {
    const pair = node(byId('totals'), 'div');
    node(pair, 'dt', {}, name);
    node(pair, 'dd', {}, data[key]);
}

// ---- the time line
const LABELS = 110, TOP = 46, LANE = 58, BAR = 30;
const SPANS = ['trimmed', 'silence', 'missing'];
const ORDER = ['log'].concat(SPANS);
const LETTERS = {'ring buffer': 'R', 'sleep log': 'S', 'I/Q samples': 'Q', firmware: 'F'};
const NAMES = {log: 'log file', trimmed: 'nothing since the start of the set',
    silence: 'no log', missing: 'missing numbers', crash: 'crash',
    firmware: 'other firmware'};
// Above and below a bar.
const LINES = {damaged: {member: 'damages', text: 'damage'},
    lost: {member: 'sequence_gaps', text: 'sequence gaps: chunks are lost'}};
const lanes = data.cps.map((cp) => cp.cp);
const COLOURS = 8;
const media = [...new Set(data.sets.concat(data.timeline).map((each) => each.medium))]
    .filter((name) => name !== undefined);
const medium = (item) => 'm' + Math.max(0, media.indexOf(item.medium)) % COLOURS;
const rank = (item) => ORDER.includes(item.kind) ? ORDER.indexOf(item.kind) : ORDER.length;
const timed = data.timeline
    .map((item) => ({...item, t0: seconds(item.from), t1: seconds(item.to),
        lane: lanes.indexOf(item.cp)}))
    .filter((item) => !Number.isNaN(item.t0) && item.lane >= 0)
    .map((item) => ({...item, t1: item.t1 >= item.t0 ? item.t1 : item.t0}));
const timedSets = data.sets.filter((set) => !Number.isNaN(seconds(set.time)));
// What a clock that was not set has named is drawn only when there is nothing else.
const SET_CLOCK = Date.UTC(2000, 0, 1) / 1000;
const wasSet = (t) => t >= SET_CLOCK;
const any = timed.some((item) => wasSet(item.t0)) ||
    timedSets.some((set) => wasSet(seconds(set.time)));
const sets = timedSets.filter((set) => !any || wasSet(seconds(set.time)));
const items = timed.filter((item) => !any || wasSet(item.t0))
    .sort((a, b) => rank(a) - rank(b) || a.t0 - b.t0);
const byTime = items.slice().sort((a, b) => a.t0 - b.t0);
const best = Object.create(null);  // the highest rate of a lane
for (const item of items) {
    best[item.cp] = Math.max(best[item.cp] || 1, item.kind === 'log' && item.rate || 0);
}
// A wrong clock may have left times that are none: what is drawn decides.
const starts = items.map((item) => item.t0).concat(sets.map((set) => seconds(set.time)));
let first = starts.length ? starts.reduce((a, b) => Math.min(a, b)) : 0;
let last = items.map((item) => item.t1).concat(starts).reduce((a, b) => Math.max(a, b), first);
const margin = Math.max(1, (last - first) * 0.02);
first -= margin;
last += margin;
let view = [first, last];
let chosen = null;

function describe(item) {
    const parts = [item.cp, NAMES[item.kind] || item.kind,
        item.from === item.to ? item.from : item.from + ' to ' + item.to];
    if (item.name) {
        parts.push(item.name + (item.files > 1 ? ' and ' + number(item.files - 1) + ' more' : ''));
    }
    if (item.size !== undefined) {
        parts.push(number(item.size) + ' bytes');
    }
    if (item.rate !== undefined) {
        parts.push(scaled(item.rate, 'B/s'));
    }
    if (item.words) {
        parts.push(item.words);
    }
    if (item.items > 1 && !item.name) {
        parts.push(number(item.items) + ' times');
    }
    if (item.damages) {
        parts.push(number(item.damages) + ' damages');
    }
    if (item.sequence_gaps) {
        parts.push(number(item.sequence_gaps) + ' sequence gaps');
    }
    if (item.medium) {
        parts.push('on ' + item.medium + (item.set ? ', set ' + item.set : ''));
    }
    return parts.join(' · ');
}

function hatch(defs, kind) {
    const pattern = node(defs, 'pattern', {id: 'hatch-' + kind, width: 6, height: 6,
        patternUnits: 'userSpaceOnUse', patternTransform: 'rotate(45)', class: kind});
    node(pattern, 'rect', {width: 3, height: 6, fill: 'currentColor', stroke: 'none'});
}

// The symbol of an event around (x, y).
function symbol(parent, kind, x, y) {
    if (kind === 'crash') {
        const points = [x, y - 8, x + 8, y + 6, x - 8, y + 6].join(' ');
        return node(parent, 'polygon', {points: points, class: 'crash'});
    }
    const circle = node(parent, 'circle', {cx: x, cy: y, r: 7, class: 'event'});
    node(parent, 'text', {x: x, y: y + 4, class: 'letter'}, LETTERS[kind] || '?');
    return circle;
}

const chart = node(byId('chart'), 'svg', {tabindex: 0, role: 'application',
    'aria-label': 'Time line of the co-processors; the keys +, -, 0, n, p and the arrows'});

function step(span, most) {
    const steps = [1, 2, 5, 10, 30, 60, 120, 300, 600, 1800, 3600, 7200, 21600, 43200, 86400];
    let s = steps.find((each) => span / each <= most);
    for (let days = 2; s === undefined; days *= 2) {
        s = span / (86400 * days) <= most ? 86400 * days : undefined;
    }
    return s;
}

function draw() {
    const width = Math.max(480, byId('chart').clientWidth || 1000);
    const height = TOP + LANE * Math.max(1, lanes.length) + 6;
    const x = (t) => LABELS + (t - view[0]) / (view[1] - view[0]) * (width - LABELS);
    // Far ends are cut: a browser does not draw lines of millions of pixels.
    const cut = (t) => Math.min(width + 20, Math.max(LABELS - 20, x(t)));
    chart.replaceChildren();
    chart.setAttribute('viewBox', '0 0 ' + width + ' ' + height);
    const defs = node(chart, 'defs');
    SPANS.forEach((kind) => hatch(defs, kind));
    const clip = node(defs, 'clipPath', {id: 'inside'});
    node(clip, 'rect', {x: LABELS, y: 0, width: width - LABELS, height: height});
    lanes.forEach((lane, i) => {
        node(chart, 'rect', {x: 0, y: TOP + LANE * i + 2, width: width, height: LANE - 4,
            class: 'lane'});
        const label = node(chart, 'text', {x: 8, y: TOP + LANE * i + LANE / 2 + 4},
            lane.length > 14 ? lane.slice(0, 13) + '…' : lane);
        node(label, 'title', {}, lane);
    });
    const inside = node(chart, 'g', {'clip-path': 'url(#inside)'});
    const by = step(view[1] - view[0], (width - LABELS) / 110);
    let day = '';
    for (let t = Math.ceil(view[0] / by) * by; t <= view[1]; t += by) {
        node(inside, 'line', {x1: x(t), x2: x(t), y1: 30, y2: height, class: 'grid'});
        const text = clock(t);
        if (text.slice(0, 10) !== day) {
            day = text.slice(0, 10);
            node(inside, 'text', {x: x(t) + 3, y: 13, class: 'soft'}, day);
        }
        if (by < 86400) {
            node(inside, 'text', {x: x(t) + 3, y: 27, class: 'soft'},
                text.slice(11, by < 60 ? 19 : 16));
        }
    }
    for (const set of sets) {
        const at = seconds(set.time);
        if (at >= view[0] && at <= view[1]) {
            const group = node(inside, 'g', {class: 'start'});
            node(group, 'line', {x1: x(at), x2: x(at), y1: 32, y2: height, class: 'set'});
            node(group, 'rect', {x: x(at), y: 32, width: 10, height: 9, class: medium(set)});
            node(group, 'title', {}, 'set ' + set.set + ' on ' + set.medium);
        }
    }
    for (const item of items) {
        if (item.t1 < view[0] || item.t0 > view[1]) {
            continue;
        }
        const group = node(inside, 'g', {class: 'item'});
        const top = TOP + LANE * item.lane + 22;
        const left = cut(item.t0);
        let shape;
        if (item.kind === 'log') {
            const wide = Math.max(1.5, cut(item.t1) - left);
            const full = BAR * Math.max(0.06, (item.rate || 0) / best[item.cp]);
            shape = node(group, 'rect', {x: left, y: top, width: wide, height: BAR,
                class: 'bar ' + medium(item)});
            node(group, 'rect', {x: left, y: top + BAR - full, width: wide, height: full,
                class: medium(item), 'fill-opacity': .55, stroke: 'none'});
            if (item.damages) {
                node(group, 'rect', {x: left, y: top - 4, width: Math.max(4, wide), height: 4,
                    class: 'damaged'});
            }
            if (item.sequence_gaps) {
                node(group, 'rect', {x: left, y: top + BAR, width: Math.max(4, wide), height: 4,
                    class: 'lost'});
            }
            if (wide > 70 && item.rate !== undefined) {
                const from = Math.max(left, LABELS);
                node(group, 'text', {x: from + 4, y: top + 13}, scaled(item.rate, 'B/s'));
            }
        } else if (SPANS.includes(item.kind)) {
            const wide = Math.max(item.kind === 'missing' ? 4 : 1.5, cut(item.t1) - left);
            shape = node(group, 'rect', {x: left, y: top, width: wide, height: BAR,
                class: item.kind, fill: 'url(#hatch-' + item.kind + ')'});
        } else {
            shape = symbol(group, item.kind, left, top - 10);
        }
        if (item === chosen) {
            shape.classList.add('chosen');
        }
        node(group, 'title', {}, describe(item));
        group.addEventListener('pointerenter', () => {
            byId('detail').textContent = describe(item);
        });
    }
    byId('range').textContent = clock(view[0]) + ' to ' + clock(view[1]);
}

// Soon, and once for all that happens until then.
let due = 0;
function redraw() {
    due = due || setTimeout(() => {
        due = 0;
        draw();
    }, 10);
}

// Shows length seconds from start on, within what there is.
function show(start, length) {
    length = Math.min(last - first, Math.max(2, length));
    start = Math.min(last - length, Math.max(first, start));
    view = [start, start + length];
    redraw();
}
function zoom(factor, at) {
    const length = view[1] - view[0];
    const share = at === undefined ? 0.5 : at;
    show(view[0] + length * share * (1 - factor), length * factor);
}
const move = (share) => show(view[0] + (view[1] - view[0]) * share, view[1] - view[0]);
function go(by) {
    const at = chosen ? byTime.indexOf(chosen) + by : by > 0 ? 0 : byTime.length - 1;
    if (!byTime[at]) {
        return;
    }
    chosen = byTime[at];
    byId('detail').textContent = describe(chosen);
    const length = view[1] - view[0];
    show(chosen.t0 < view[0] || chosen.t0 > view[1] ? chosen.t0 - length / 2 : view[0], length);
}
const ACTIONS = {'+': () => zoom(0.5), '=': () => zoom(0.5), '-': () => zoom(2),
    0: () => show(first, last - first), ArrowLeft: () => move(-0.25),
    ArrowRight: () => move(0.25), n: () => go(1), p: () => go(-1)};
chart.addEventListener('keydown', (event) => {
    if (ACTIONS[event.key] && !event.ctrlKey && !event.metaKey && !event.altKey) {
        event.preventDefault();
        ACTIONS[event.key]();
    }
});
for (const [id, key] of [['zoom-in', '+'], ['zoom-out', '-'], ['left', 'ArrowLeft'],
    ['right', 'ArrowRight'], ['all', 0]]) {
    byId(id).addEventListener('click', ACTIONS[key]);
}
// The share of the drawn time that lies left of the pointer.
function share(event) {
    const box = chart.getBoundingClientRect();
    const drawn = chart.viewBox.baseVal.width;
    const at = (event.clientX - box.left) / box.width * drawn;
    return Math.min(1, Math.max(0, (at - LABELS) / (drawn - LABELS)));
}
chart.addEventListener('wheel', (event) => {
    event.preventDefault();
    zoom(event.deltaY < 0 ? 0.8 : 1.25, share(event));
}, {passive: false});
let held = null;
chart.addEventListener('pointerdown', (event) => {
    held = event.button ? null : {at: share(event), from: view[0]};
});
window.addEventListener('pointermove', (event) => {
    if (!event.buttons) {  // it was released elsewhere
        held = null;
    } else if (held) {
        const length = view[1] - view[0];
        show(held.from - (share(event) - held.at) * length, length);
    }
});
for (const end of ['pointerup', 'pointercancel']) {
    window.addEventListener(end, () => { held = null; });
}
window.addEventListener('resize', redraw);

function legend(kind, text) {
    const entry = node(byId('legend'), 'li');
    const picture = node(entry, 'svg', {width: 18, height: 18, 'aria-hidden': true});
    if (kind[0] === 'm' && kind.length === 2) {
        node(picture, 'rect', {y: 2, width: 18, height: 14, class: kind, 'fill-opacity': .55});
    } else if (SPANS.includes(kind)) {
        node(picture, 'rect', {y: 2, width: 18, height: 14, class: kind,
            fill: 'url(#hatch-' + kind + ')'});
    } else if (kind in LINES) {
        node(picture, 'rect', {y: 7, width: 18, height: 4, class: kind});
    } else {
        symbol(picture, kind, 9, 9);
    }
    node(entry, 'span', {}, text);
}
media.forEach((name, i) => legend('m' + i % COLOURS, 'log on ' + name));
for (const kind of SPANS.concat(['crash'], Object.keys(LETTERS))) {
    if (items.some((item) => item.kind === kind)) {
        legend(kind, NAMES[kind] || kind);
    }
}
for (const kind in LINES) {
    if (items.some((item) => item.kind === 'log' && item[LINES[kind].member])) {
        legend(kind, LINES[kind].text);
    }
}
function tell(id, text) {
    byId(id).hidden = false;
    byId(id).textContent = text;
}
if (data.most_merged > 1) {
    tell('merged', 'There is too much to draw all of it: up to ' + number(data.most_merged) +
        ' neighbours are drawn as one. The tables count everything.');
}
if (data.more_sets) {
    tell('more-sets', 'Only the starts of the first ' + number(data.sets.length) +
        ' sets are drawn and listed; there are ' + number(data.more_sets) + ' more.');
}
if (items.length < timed.length || sets.length < timedSets.length) {
    tell('unset', 'The clock was not set for ' +
        number(timed.length - items.length) + ' of ' + number(timed.length) + ' items and ' +
        number(timedSets.length - sets.length) + ' of ' + (data.more_sets ? 'the first ' : '') +
        number(timedSets.length) +
        ' sets: their times lie before 2000, so they are not drawn. The tables count them.');
}
if (starts.length) {
    draw();
} else {
    byId('line').hidden = true;
    tell('unset', 'Nothing here has a time.');
}

// ---- spectra and waveforms
function figure(title) {
    const made = node(byId('pictures'), 'figure');
    node(made, 'figcaption', {}, title);
    return made;
}
function colour(part) {  // from dark blue over red and yellow to white
    const stops = [[0, 0, 20], [60, 10, 110], [200, 45, 75], [250, 180, 40], [255, 255, 230]];
    const at = part * (stops.length - 1);
    const i = Math.min(stops.length - 2, Math.floor(at));
    return stops[i].map((c, k) => c + (stops[i + 1][k] - c) * (at - i));
}
if (data.spectra.length) {
    node(byId('pictures'), 'h2', {}, 'I/Q captures');
}
for (const each of data.spectra) {
    const length = rounded(each.samples / each.rate);
    const text = each.cp + ' · ' + each.name + ' · ' + number(each.samples) + ' samples of ' +
        each.format + ', ' + length + ' s from left to right · up: frequency from ' +
        number(-each.rate / 2) + ' to ' + number(each.rate / 2) + ' Hz';
    const made = figure(text);
    if (!each.columns) {
        made.firstChild.textContent += ' · too short for a spectrum (' + each.bins + ' samples)';
        continue;
    }
    const canvas = node(made, 'canvas', {width: each.columns, height: each.bins, role: 'img',
        'aria-label': 'Spectrum over time'});
    const levels = Array.from(atob(each.levels), (c) => c.charCodeAt(0));
    // All colours go to the levels that there are.
    const low = levels.reduce((a, b) => Math.min(a, b), 255);
    const high = levels.reduce((a, b) => Math.max(a, b), low + 1);
    const db = (level) => (each.lowest_db * (1 - level / 255)).toFixed(0);
    canvas.previousSibling.textContent += ' · dark ' + db(low) + ' dB, light ' + db(high) +
        ' dB of full scale';
    const context = canvas.getContext('2d');
    const image = context.createImageData(each.columns, each.bins);
    for (let i = 0; i < levels.length; ++i) {
        const row = each.bins - 1 - i % each.bins;  // high frequencies on top
        const at = 4 * (row * each.columns + Math.floor(i / each.bins));
        image.data.set([...colour((levels[i] - low) / (high - low)), 255], at);
    }
    context.putImageData(image, 0, 0);
}
noteMore(byId('pictures'), data.more_spectra);
if (data.waveforms.length) {
    node(byId('pictures'), 'h2', {}, 'PCM data');
}
for (const each of data.waveforms) {
    const text = each.cp + (each.set ? ' · set ' + each.set : '') + ' · ' +
        number(each.samples) + ' samples of ' + each.format + ' a channel, ' +
        rounded(each.samples / each.rate) + ' s at ' + number(each.rate) +
        ' Hz · least and greatest of every ' + number(each.samples_per_point);
    const made = figure(text);
    for (const points of each.channels) {
        const count = points.length / 2;
        const picture = node(made, 'svg', {viewBox: '0 -1000 ' + count + ' 2000', width: '100%',
            height: 90, preserveAspectRatio: 'none', role: 'img', 'aria-label': 'Waveform'});
        let path = '';
        for (let i = 0; i < count; ++i) {
            path += (i ? 'L' : 'M') + i + ' ' + -points[2 * i + 1];
        }
        for (let i = count - 1; i >= 0; --i) {
            path += 'L' + i + ' ' + -points[2 * i];
        }
        node(picture, 'path', {d: path + 'Z', class: 'wave', 'vector-effect': 'non-scaling-stroke'});
    }
}
noteMore(byId('pictures'), data.more_waveforms);

// ---- tables
// Columns: heading and either a key of the row or a function of it. Numbers stand to the right.
function table(list, caption, rows, columns, more) {
    if (!rows.length) {
        return;
    }
    const place = node(byId('tables'), 'div', {class: 'scroll'});
    const made = node(place, 'table', {id: 'table-' + list});
    node(made, 'caption', {}, caption);
    const head = node(node(made, 'thead'), 'tr');
    const value = (row, key) => typeof key === 'function' ? key(row) : row[key];
    const columnIsNumber = columns.map(([, key]) =>
        rows.every((row) => ['number', 'undefined'].includes(typeof (value(row, key) || 0))));
    const classes = columns.map(([, key], i) =>
        columnIsNumber[i] ? 'number' : typeof key === 'string' ? key : '');
    columns.forEach(([name], i) => node(head, 'th', {scope: 'col', class: classes[i]}, name));
    const body = node(made, 'tbody');
    for (const row of rows) {
        const line = node(body, 'tr');
        columns.forEach(([, key], i) => {
            const content = value(row, key);
            const cell = node(line, 'td', {class: classes[i]},
                columnIsNumber[i] ? number(content) : content === null ? '-' : content);
            const at = key === 'time' && list === 'crashes' ? seconds(row.time) : NaN;
            if (at >= first && at <= last) {
                const button = node(cell, 'button', {type: 'button', title: 'Show it'}, '↑');
                button.addEventListener('click', () => {
                    show(at - 300, 600);
                    byId('time').scrollIntoView();
                });
            }
        });
    }
    noteMore(place, more || data['more_' + list]);
}
const WHERE = [['medium', 'medium'], ['set', 'set']];
const hex = (n) => '0x' + n.toString(16).padStart(2, '0');
table('crashes', 'Crashes', data.crashes, [['time', 'time'], ['co-processor', 'cp'],
    ['left', 'what'], ['bytes', 'size'], ['damages', 'damages'],
    ['files', (row) => row.files.join('\n')], ...WHERE]);
table('cps', 'Co-processors', data.cps, [['co-processor', 'cp'], ['files', 'files'],
    ['bytes', 'size'], ['log files', 'logs'], ['bytes of logs', 'log_size'],
    ['seconds', 'seconds'], ['bytes/s', 'rate'], ['frames', 'frames'], ['chunks', 'chunks'],
    ['broken frames', 'broken'], ['payload', 'payload'], ['other bytes', 'other_bytes'],
    ['sequence gaps', 'sequence_gaps'], ['missing files', 'missing'], ['damages', 'damages'],
    ['notes', 'notes']]);
table('types', 'Types of frames and chunks in the logs',
    data.cps.flatMap((cp) => cp.types.map((type) => ({cp: cp.cp, ...type}))),
    [['co-processor', 'cp'], ['type', (row) => hex(row.type)],
        ['sub-type', (row) => hex(row.sub_type)], ['count', 'count'],
        ['bytes of payload', 'bytes'], ['bytes/s', 'rate']],
    data.cps.reduce((sum, cp) => sum + (cp.more_types || 0), 0));
table('sets', 'Sets', data.sets, [['set', (row) => row.set || row.path], ['medium', 'medium'],
    ['from', 'from'], ['to', 'to'], ['co-processors', 'cps'], ['files', 'files'],
    ['bytes', 'size'], ['damages', 'damages']]);
table('versions', 'Firmware', data.versions, [['co-processor', 'cp'], ['version', 'version'],
    ['changed', (row) => row.changed ? 'yes' : ''], ...WHERE]);
table('databases', 'Parsing library', data.databases, [['file', 'path'], ['bytes', 'size'],
    ['digest', (row) => row.digest || '']]);
table('findings', 'Damages and notes', data.findings,
    [['', (row) => row.damage ? 'damage' : 'note'], ['what', 'meaning'],
        ['at byte', (row) => row.offset === undefined ? '' : number(row.offset)],
        ['file', 'path']]);
table('unreadable', 'What could not be read', data.unreadable.map((words) => ({words: words})),
    [['', 'words']]);
}());
