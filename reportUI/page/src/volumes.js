// Volumes: what each one's numbers mean, its card, and the drawing of their history.
import {axisBottom, axisLeft} from 'd3-axis';
import {scaleLinear, scaleUtc} from 'd3-scale';
import {select} from 'd3-selection';
import {arc, line} from 'd3-shape';

import {h, shown, shownPlain, svg} from './dom.js';
import * as format from './format.js';
import {sizeElement, table} from './table.js';

const DAY = 86400;
const MOST_SENSIBLE_DAYS = 36525;  // beyond a century, or below 0, there is no growth to speak of
const STATES = {critical: {percent: 95, days: 14}, warn: {percent: 85, days: 60}};
const NEVER = Infinity;
const SHORTEST_HISTORY = 3600;  // seconds; a first run stores a sample of its own

const isShort = samples => samples.length < 2 ||
  samples[0].date - samples.at(-1).date < SHORTEST_HISTORY;

// When the volume is full, in words that agree with the days that the program estimated:
// {text, days, order}. The estimate says 0 both for "within a day" and for "has not grown"; the
// samples tell which.
function outlookOf({free, total, percent, days, samples}) {
  const outlook = (key, count, values) => ({
    text: format.say(key, values), days: count, order: count});
  if (!total) {
    return outlook('unknownSize', NEVER);
  }
  if (free === 0n) {
    return outlook('full', 0);
  }
  const count = Number(days);
  if (days === '-' || (count === 0 && isShort(samples))) {
    return outlook('noHistory', NEVER);
  }
  if (count > 0 && count <= MOST_SENSIBLE_DAYS) {
    return outlook('fullWhen', count, {when: format.inDays(count)});
  }
  const lower = samples.slice(1).find(sample => sample.percent < percent &&
    sample.date < samples[0].date);
  if (count === 0 && lower) {
    const perDay = (percent - lower.percent) / (samples[0].date - lower.date) * DAY;
    if ((100 - percent) / perDay < 1.5) {
      return outlook('fullToday', 0);
    }
  }
  return outlook('noGrowth', NEVER);
}

function stateOf({percent, outlook}) {
  return Object.keys(STATES).find(state => percent >= STATES[state].percent ||
    outlook.days <= STATES[state].days) ?? 'ok';
}

const bytes = text => format.isNumber(text) ? BigInt(text) : undefined;

// The volumes of the rows (identifier, used, free, percent, days) with their samples, newest first,
// the most pressing first. `history`: the tables of the history block, undefined without one.
export function readVolumes(rows, history) {
  return rows.map(([name, used, free, , days]) => {
    const volume = {name, used: bytes(used), free: bytes(free), days};
    const known = volume.used !== undefined && volume.free !== undefined;
    volume.total = known ? volume.used + volume.free : undefined;
    // Not the percentage of the row: it has but seven characters.
    volume.percent = volume.total ? Number(volume.used) / Number(volume.total) * 100 : NaN;
    volume.samples = (history?.get(name) ?? []).map(([date, percent]) => (
      {date: Number(date), percent: parseFloat(percent)})).filter(
      sample => sample.date > 0 && Number.isFinite(sample.percent));
    volume.outlook = outlookOf(volume);
    volume.state = stateOf(volume);
    return volume;
  }).sort((one, two) => (two.percent || 0) - (one.percent || 0));
}

const STATE_TEXTS = {ok: 'stateOk', warn: 'stateWarn', critical: 'stateCritical'};
const STATE_SHAPES = {ok: 'M2 7.5 6 11.5 12.5 3', warn: 'M7 1.5 13 12.5H1Z M7 5.5V9 M7 10.6v.6',
                      critical: 'M4.5 1h5L13 4.5v5L9.5 13h-5L1 9.5v-5Z M7 3.8v4 M7 9.6v.8'};

// A sign for a state: its shape and its word.
export function stateElement(state, withWord = true) {
  return h('span', {class: `state ${state}`},
           svg('svg', {viewBox: '0 0 14 14', 'aria-hidden': 'true'},
               svg('path', {d: STATE_SHAPES[state]})),
           h('span', {class: withWord ? '' : 'unseen'}, format.say(STATE_TEXTS[state])));
}

function gauge({percent, state}) {
  const share = Math.max(0, Math.min(1, (percent || 0) / 100));
  const piece = arc().innerRadius(33).outerRadius(44).startAngle(-2.2);
  return svg('svg', {class: `gauge ${state}`, viewBox: '-46 -46 92 76', 'aria-hidden': 'true'},
             svg('path', {class: 'track', d: piece.endAngle(2.2)()}),
             svg('path', {class: 'value', d: piece.endAngle(-2.2 + 4.4 * share)()}),
             svg('text', {y: 7}, format.percent(percent, 0)));
}

export function card(volume) {
  return h('article', {class: `card ${volume.state}`},
           gauge(volume),
           h('div', {},
             h('h3', {title: shownPlain(volume.name)}, shown(volume.name)),
             h('p', {class: 'unseen'}, format.percent(volume.percent)),
             h('p', {class: 'outlook'}, stateElement(volume.state), ' ', volume.outlook.text),
             h('p', {}, ...format.sayNodes('usedOf', {
               used: sizeElement(volume.used), total: sizeElement(volume.total)})),
             h('p', {}, ...format.sayNodes('freeLeft', {size: sizeElement(volume.free)}))));
}

// --- History ------------------------------------------------------------------------------------

const WIDTH = 1180, LEAST_HEIGHT = 320, LEFT = 56, RIGHT = 12, TOP = 18, BOTTOM = 28;
const LABEL_HEIGHT = 17;

// Labels beside the newest samples, pushed apart so that none covers another. The last is at
// `lowest` at most.
function spread(labels, lowest) {
  labels.sort((one, two) => one.y - two.y);
  labels.forEach((label, i) => {
    label.at = Math.max(label.y, i ? labels[i - 1].at + LABEL_HEIGHT : TOP);
  });
  for (let i = labels.length - 1; i >= 0; --i) {
    labels[i].at = Math.min(labels[i].at, lowest - (labels.length - 1 - i) * LABEL_HEIGHT);
  }
  return labels;
}

const cut = (text, length) => text.length > length ? `…${text.slice(1 - length)}` : text;

// Where the dashed line ends: full, or the edge of the drawing.
function forecastEnd(volume, now, last) {
  const seconds = Math.max(volume.outlook.days, 0.5) * DAY;
  const share = Math.min(1, (last - now) / seconds);
  return {date: now + seconds * share, percent: volume.percent + (100 - volume.percent) * share};
}

function drawHistory(volumes) {
  const dates = volumes.flatMap(({samples}) => samples.map(({date}) => date));
  const now = Math.max(...volumes.map(({samples}) => samples[0].date));
  const first = Math.min(...dates, now - DAY);
  const days = volumes.map(({outlook}) => outlook.days).filter(count => count !== NEVER);
  // The time to come gets room for the labels, and at most half as much as the time that was.
  const past = now - first;
  const last = now + Math.min(Math.max(past / 4, Math.max(0, ...days) * DAY * 1.05), past / 2);
  const wall = format.wallClock;
  const height = Math.max(LEAST_HEIGHT, TOP + BOTTOM + volumes.length * LABEL_HEIGHT);
  const x = scaleUtc([wall(first), wall(last)], [LEFT, WIDTH - RIGHT]);
  const y = scaleLinear([0, 100], [height - BOTTOM, TOP]);
  const path = line().x(({date}) => x(wall(date))).y(({percent}) => y(percent));
  const spanDays = (last - first) / DAY;
  const dayFormat = spanDays > 300 ? {year: 'numeric', month: 'short'} :
    {month: 'short', day: 'numeric'};

  const drawing = svg('svg', {class: 'history', viewBox: `0 0 ${WIDTH} ${height}`, role: 'img',
                              'aria-label': format.say('historyText')});
  // One at the very edge would be cut.
  const ticks = x.ticks(Math.min(7, Math.max(2, Math.floor(spanDays)))).filter(
    date => x(date) < WIDTH - 36);
  for (const [axis, at] of [
    [axisBottom(x).tickValues(ticks).tickFormat(date => format.wallDay(+date, dayFormat)),
     `translate(0,${height - BOTTOM})`],
    [axisLeft(y).tickValues([0, 25, 50, 75, 100]).tickFormat(format.percent)
      .tickSize(LEFT + RIGHT - WIDTH), `translate(${LEFT},0)`]]) {
    select(drawing.appendChild(svg('g', {class: 'axis', transform: at}))).call(
      axis.tickPadding(8)).attr('font-family', null).attr('font-size', null);
  }
  drawing.append(
    svg('line', {class: 'limit', x1: LEFT, x2: WIDTH - RIGHT, y1: y(100), y2: y(100)}),
    svg('line', {class: 'today', x1: x(wall(now)), x2: x(wall(now)), y1: TOP, y2: y(0)}),
    svg('text', {class: 'mark', x: x(wall(now)) - 5, y: y(0) - 6, 'text-anchor': 'end'},
        format.say('today')));
  const labels = volumes.map(volume => {
    const group = drawing.appendChild(svg('g', {class: `line series${format.seriesOf(volume.name)}`}));
    group.append(svg('title', {}, shownPlain(volume.name)), svg('path', {d: path(volume.samples)}));
    const [newest] = volume.samples;
    if (volume.outlook.days !== NEVER && volume.percent < 100) {
      group.append(svg('path', {
        class: 'forecast', d: path([newest, forecastEnd(volume, now, last)])}));
    }
    group.append(svg('circle', {r: 3.5, cx: x(wall(newest.date)), cy: y(newest.percent)}));
    return {group, volume, y: y(newest.percent)};
  });
  for (const {group, volume, y: from, at} of spread(labels, height - BOTTOM)) {
    if (at !== from) {  // a thin line tells whose label it is
      group.append(svg('path', {class: 'leader', d: `M${x(wall(now)) + 3},${from}l6,${at - from}`}));
    }
    drawing.append(svg('text', {class: 'label', x: x(wall(now)) + 10, y: at + 4},
                       svg('title', {}, shownPlain(volume.name)),
                       cut(shownPlain(volume.name), 24)));
  }
  return drawing;
}

// A series in a table: a row a day, with the newest sample of the day.
function historyTable(volumes) {
  const rows = volumes.flatMap(({name, samples}) => {
    const newest = new Map();
    for (const sample of samples) {
      const key = format.day(sample.date);
      if (!newest.has(key)) {
        newest.set(key, [name, String(sample.date), String(sample.percent)]);
      }
    }
    return [...newest.values()];
  });
  return table([['volume', 'name'], ['time', 'time'], ['percent', 'percent']], rows,
               {caption: format.say('history')});
}

// The drawing with its data as a table; a note when there is nothing to draw.
export function history(volumes, hasHistory) {
  if (!hasHistory) {
    return [h('p', {class: 'note'}, format.say('historyMissing'))];
  }
  const drawn = volumes.filter(({samples}) => samples.length > 0);
  if (drawn.every(({samples}) => isShort(samples))) {
    return [h('p', {class: 'note'}, format.say('historyShort'))];
  }
  const details = h('details', {}, h('summary', {}, format.say('chartData')));
  const fill = () => {
    if (details.children.length < 2) {
      details.append(historyTable(drawn));
    }
  };
  details.addEventListener('toggle', fill, {once: true});
  return [h('p', {class: 'lead'}, format.say('historyText')),
          h('div', {class: 'scroll', role: 'group', tabindex: 0,
                    'aria-label': format.say('history')}, drawHistory(drawn)), details];
}
