// The drawing of the volumes over time, with the forecast and its range.
import {axisBottom, axisLeft} from 'd3-axis';
import {scaleLinear, scaleUtc} from 'd3-scale';
import {select} from 'd3-selection';
import {line} from 'd3-shape';

import {h, shownPlain, svg} from './dom.js';
import * as format from './format.js';
import {jumpText} from './outlook.js';
import {table} from './table.js';

const DAY = 86400;
const WIDTH = 1180, LEAST_HEIGHT = 320, LEFT = 56, RIGHT = 12, TOP = 18, BOTTOM = 28;
const LABEL_HEIGHT = 17;
const BELOW = 15;  // of a label beside a line that goes up, so that it covers nothing of it
const DIAMOND = 'M0-6.5 6.5 0 0 6.5-6.5 0Z';

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

const isGrowing = ({forecast}) => forecast.state === 'growing' && forecast.days !== undefined;
const percentAt = ({size}, used) => used / size * 100;

// The line of a volume: its samples, and what it holds now.
function pointsOf(volume, now) {
  return [...volume.samples.map(({date, used}) => ({date, percent: percentAt(volume, used)})),
          {date: now, percent: percentAt(volume, volume.used)}];
}

// The dashed line and the band around it, as points, up to where the volume is full or to `last`,
// the edge of the drawing.
function forecastOf(volume, from, last) {
  const {days, days_low: low = days, days_high: high = days} = volume.forecast;
  const end = count => {
    const seconds = Math.max(count, 0.5) * DAY;
    const share = Math.min(1, (last - from.date) / seconds);
    return {date: from.date + seconds * share, percent: from.percent + (100 - from.percent) * share};
  };
  const [soonest, latest] = [end(low), end(high)];
  return {dashed: [from, end(days)],
          band: [from, soonest, {date: latest.date, percent: soonest.percent}, latest]};
}

function axes({x, y, height, days}) {
  const dayFormat = days > 300 ? {year: 'numeric', month: 'short'} : {month: 'short', day: 'numeric'};
  // One at the very edge would be cut.
  const ticks = x.ticks(Math.min(7, Math.max(2, Math.floor(days)))).filter(
    date => x(date) < WIDTH - 36);
  return [
    [axisBottom(x).tickValues(ticks).tickFormat(date => format.wallDay(+date, dayFormat)),
     `translate(0,${height - BOTTOM})`],
    [axisLeft(y).tickValues([0, 25, 50, 75, 100]).tickFormat(format.percent)
      .tickSize(LEFT + RIGHT - WIDTH), `translate(${LEFT},0)`]].map(([axis, transform]) => {
    const group = svg('g', {class: 'axis', transform});
    select(group).call(axis.tickPadding(8)).attr('font-family', null).attr('font-size', null);
    return group;
  });
}

function seriesElement(volume, {now, last, x, y}) {
  const at = ({date, percent}) => [x(format.wallClock(date)), y(percent)];
  const path = points => line()(points.map(at));
  const points = pointsOf(volume, now);
  const current = points.at(-1);
  const group = svg('g', {class: `line series${format.seriesOf(volume.id)}`},
                    svg('title', {}, shownPlain(volume.path)));
  if (isGrowing(volume)) {
    const {dashed, band} = forecastOf(volume, current, last);
    group.append(svg('path', {class: 'range', d: `${path(band)}Z`}),
                 svg('path', {class: 'forecast', d: path(dashed)}));
  }
  group.append(svg('path', {d: path(points)}));
  const {jump} = volume.forecast;
  if (jump) {
    const place = at(points.find(({date}) => date >= jump.date) ?? current);
    group.append(svg('path', {class: 'jump', d: DIAMOND, transform: `translate(${place})`},
                     svg('title', {}, `${shownPlain(volume.path)}: ${jumpText(jump)}`)));
  }
  const [cx, cy] = at(current);
  group.append(svg('circle', {r: 3.5, cx, cy}));
  return {group, from: cy, y: isGrowing(volume) ? cy + BELOW : cy};
}

function drawHistory(volumes, now, label) {
  const first = Math.min(now - DAY, ...volumes.map(({samples}) => samples[0]?.date ?? now));
  const days = volumes.filter(isGrowing).map(
    ({forecast}) => forecast.days_high ?? forecast.days);
  // The time to come gets room for the labels, and at most half as much as the time that was.
  const past = now - first;
  const last = now + Math.min(Math.max(past / 4, Math.max(0, ...days) * DAY * 1.05), past / 2);
  const height = Math.max(LEAST_HEIGHT, TOP + BOTTOM + volumes.length * LABEL_HEIGHT);
  const x = scaleUtc([format.wallClock(first), format.wallClock(last)], [LEFT, WIDTH - RIGHT]);
  const y = scaleLinear([0, 100], [height - BOTTOM, TOP]);
  const today = x(format.wallClock(now));

  const drawing = svg('svg', {class: 'history', viewBox: `0 0 ${WIDTH} ${height}`, role: 'img',
                              'aria-label': label},
    ...axes({x, y, height, days: (last - first) / DAY}),
    svg('line', {class: 'limit', x1: LEFT, x2: WIDTH - RIGHT, y1: y(100), y2: y(100)}),
    svg('line', {class: 'today', x1: today, x2: today, y1: TOP, y2: y(0)}),
    svg('text', {class: 'mark', x: today - 5, y: y(0) - 6, 'text-anchor': 'end'},
        format.say('today')));
  const labels = volumes.map(volume => ({volume, ...seriesElement(volume, {now, last, x, y})}));
  drawing.append(...labels.map(({group}) => group));
  for (const {group, volume, from, y: wanted, at} of spread(labels, height - BOTTOM)) {
    if (at !== wanted) {  // a thin line tells whose label it is
      group.append(svg('path', {class: 'leader', d: `M${today + 3},${from}l6,${at - from}`}));
    }
    drawing.append(svg('text', {class: 'label', x: today + 10, y: at + 4},
                       svg('title', {}, shownPlain(volume.path)),
                       cut(shownPlain(volume.path), 24)));
  }
  return drawing;
}

function historyTable(volumes) {
  const rows = volumes.flatMap(volume => volume.samples.map(({date, used}) => [
    volume.path, String(date), String(percentAt(volume, used))]));
  return table([['volume', 'name'], ['time', 'time'], ['percent', 'percent']], rows.reverse(),
               {caption: format.say('history')});
}

// The drawing with its data as a table; a note when there is nothing to draw.
export function history(volumes, finished) {
  const drawn = volumes.filter(({size}) => size > 0);
  if (drawn.every(({samples}) => samples.length < 2)) {
    return [h('p', {class: 'note'}, format.say('historyShort'))];
  }
  const now = Math.max(finished, ...drawn.map(({samples}) => samples.at(-1)?.date ?? 0));
  const text = [['historyText', true], ['forecastText', drawn.some(isGrowing)],
                ['jumpText', drawn.some(({forecast}) => forecast.jump)]].filter(
    ([, isThere]) => isThere).map(([key]) => format.say(key)).join(' ');
  const details = h('details', {}, h('summary', {}, format.say('chartData')));
  details.addEventListener('toggle', () => details.append(historyTable(drawn)), {once: true});
  return [h('p', {class: 'lead'}, text),
          h('div', {class: 'scroll', role: 'group', tabindex: 0,
                    'aria-label': format.say('history')}, drawHistory(drawn, now, text)), details];
}
