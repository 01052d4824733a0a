// The volumes over time: a drawing for each, of the same scale and with one axis of time, and what a
// pointer or the arrow keys point at.
import {scaleLinear, scaleUtc} from 'd3-scale';
import {line} from 'd3-shape';

import {drawnIn} from './charts.js';
import {h, shown, shownPlain, svg} from './dom.js';
import {fold} from './folds.js';
import * as format from './format.js';
import {jumpText, outlookText} from './outlook.js';
import {table} from './table.js';

const DAY = 86400;
const SAMPLES = 'volume_usage.samples';
const HEIGHT = 128, LEFT = 44, RIGHT = 8, TOP = 8, BOTTOM = 20;
const DIAMOND = 'M0-6 6 0 0 6-6 0Z';
const TICK_WIDTH = 84;
const PAPER = 340;  // pixels of one of two columns

const isGrowing = ({forecast}) => forecast.state === 'growing' && forecast.days !== undefined;
// A sample may tell the volume's size at its time.
const percentAt = (volume, {used, size = volume.size}) => used / size * 100;

// The line of a volume, up to what it holds now: its samples, or its rows of `before` where there are
// more of those.
function pointsOf(volume, now, before) {
  const rows = (before?.get(volume.id) ?? []).map(
    ([date, percent]) => ({date: Number(date), percent: parseFloat(percent)})).filter(
    ({date, percent}) => date > 0 && date <= now && percent >= 0).reverse();
  const points = rows.length > volume.samples.length ? rows :
    volume.samples.map(sample => ({date: sample.date, percent: percentAt(volume, sample)}));
  return points.at(-1)?.date > now - DAY ? points : [...points, {date: now, percent: percentAt(volume, volume)}];
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

// The time that all drawings show: what was, and at most half as much of what will be.
function spanOf(courses, now) {
  const first = Math.min(now - DAY, ...courses.map(({points}) => points[0].date));
  const days = courses.map(({volume}) => volume).filter(isGrowing).map(({forecast}) => forecast.days_high ?? forecast.days);
  const past = now - first;
  return {first, now, last: now + Math.min(Math.max(past / 20, Math.max(0, ...days) * DAY * 1.05), past / 2)};
}

function axes({x, y, width, first, last}) {
  const days = (last - first) / DAY;
  const dayFormat = days > 300 ? {year: 'numeric', month: 'short'} : {month: 'short', day: 'numeric'};
  // One at the very edge would be cut.
  const ticks = x.ticks(Math.max(2, Math.min(Math.floor(days), Math.floor(width / TICK_WIDTH)))).filter(
    date => x(date) < width - 30 && x(date) > LEFT + 10);
  return svg('g', {class: 'axis'},
    ...[0, 50, 100].flatMap(percent => [
      svg('line', {x1: LEFT, x2: width - RIGHT, y1: y(percent), y2: y(percent),
                   class: percent === 100 ? 'limit' : ''}),
      svg('text', {x: LEFT - 6, y: y(percent) + 4, 'text-anchor': 'end'}, format.percent(percent))]),
    ...ticks.map(date => svg('text', {x: x(date), y: HEIGHT - 4, 'text-anchor': 'middle'},
                             format.wallDay(+date, dayFormat))));
}

function draw(volume, points, span, width) {
  const x = scaleUtc([format.wallClock(span.first), format.wallClock(span.last)], [LEFT, width - RIGHT]);
  const y = scaleLinear([0, 100], [HEIGHT - BOTTOM, TOP]);
  const at = ({date, percent}) => [x(format.wallClock(date)), y(percent)];
  const path = list => line()(list.map(at));
  const current = points.at(-1);
  const [cx, cy] = at(current);
  const group = svg('g', {class: `line ${volume.level}`});
  if (isGrowing(volume)) {
    const {dashed, band} = forecastOf(volume, current, span.last);
    group.append(svg('path', {class: 'range', d: `${path(band)}Z`}),
                 svg('path', {class: 'forecast', d: path(dashed)}));
  }
  group.append(svg('path', {class: 'past', d: path(points)}));
  const {jump} = volume.forecast;
  if (jump) {
    const place = at(points.find(({date}) => date >= jump.date) ?? current);
    group.append(svg('path', {class: 'jump', d: DIAMOND, transform: `translate(${place})`},
                     svg('title', {}, jumpText(jump))));
  }
  const cursor = svg('line', {class: 'cursor', x1: cx, x2: cx, y1: TOP, y2: y(0)});
  const dot = svg('circle', {r: 3.5, cx, cy});
  group.append(dot);
  const drawing = svg('svg', {class: 'history', viewBox: `0 0 ${width} ${HEIGHT}`},
                      axes({x, y, width, ...span}),
                      svg('line', {class: 'today', x1: cx, x2: cx, y1: TOP, y2: y(0)}), group, cursor);
  return {drawing, dateAt: left => +x.invert(left), point: to => {
    const [left, top] = at(to);
    cursor.setAttribute('x1', left);
    cursor.setAttribute('x2', left);
    dot.setAttribute('cx', left);
    dot.setAttribute('cy', top);
  }};
}

// The drawing of one volume. `point` shows its sample nearest to a moment, or the newest again.
class Chart {
  constructor({volume, points}, span, pointAll) {
    this.points = points;
    this.said = h('span', {class: 'said-value'});
    this.path = volume.path;
    const place = drawnIn(h('div', {class: 'place'}), width => {
      this.drawn = draw(volume, this.points, span, width);
      place.replaceChildren(this.drawn.drawing);
    }, PAPER);
    place.addEventListener('pointermove', ({clientX}) => pointAll(
      this.drawn?.dateAt(clientX - place.getBoundingClientRect().left)));
    this.element = h('div', {class: `chart ${volume.level}`, title: shownPlain(volume.path)},
                     h('div', {class: 'head'}, h('b', {}, shown(volume.path)), this.said,
                       h('span', {class: 'ahead'}, outlookText(volume))), place);
    this.point();
  }

  // `wall`: milliseconds of the server's clock. The words for the point.
  point(wall) {
    const distance = ({date}) => Math.abs(format.wallClock(date) - wall);
    const found = wall === undefined ? this.points.at(-1) : this.points.reduce(
      (best, each) => distance(each) < distance(best) ? each : best);
    const day = wall === undefined ? '' : `${format.day(found.date)}: `;
    this.said.textContent = day + format.percent(found.percent);
    this.drawn?.point(found);
    return `${shownPlain(this.path)} ${format.percent(found.percent)}`;
  }
}

function historyTable(courses) {
  const rows = courses.flatMap(({volume, points}) => points.map(
    ({date, percent}) => [volume.path, String(date), String(percent)]));
  return table([['volume', 'name'], ['time', 'time'], ['percent', 'percent']], rows.reverse(),
               {key: SAMPLES, caption: format.say('history')});
}

// All drawings. Pointed at one, all say what they held then; arrow keys do the same.
function drawings(courses, span) {
  const days = Math.round((span.now - span.first) / DAY);
  const figure = h('div', {class: 'charts', role: 'slider', tabindex: 0, 'aria-label': format.say('history'),
                           'aria-valuemin': -days, 'aria-valuemax': 0});
  const point = (wall, ago) => {
    const words = charts.map(chart => chart.point(wall));
    figure.setAttribute('aria-valuenow', -ago);
    figure.setAttribute('aria-valuetext', `${format.day(span.now - ago * DAY)}: ${words.join(', ')}`);
  };
  const charts = courses.map(course => new Chart(course, span, wall => wall !== undefined && point(
    wall, Math.max(0, Math.round((format.wallClock(span.now) - wall) / DAY / 1000)))));
  let ago = 0;
  figure.addEventListener('pointerleave', () => point(undefined, 0));
  figure.addEventListener('keydown', event => {
    const step = {ArrowLeft: 1, ArrowDown: 1, ArrowRight: -1, ArrowUp: -1, PageDown: 7, PageUp: -7,
                  Home: days, End: -days}[event.key];
    if (step) {
      event.preventDefault();
      ago = Math.max(0, Math.min(days, ago + step));
      point(ago ? format.wallClock(span.now - ago * DAY) : undefined, ago);
    }
  });
  figure.append(...charts.map(({element}) => element));
  point(undefined, 0);
  return figure;
}

// The drawings with their data as a table; a note when there is nothing to draw. `before`: Map of a
// volume's id to rows of time and percent, the newest first, if the page has those.
export function history(volumes, finished, before) {
  const drawn = volumes.filter(({size}) => size > 0);
  if (drawn.every(({samples}) => samples.length < 2)) {
    return [h('p', {class: 'note'}, format.say('historyShort'))];
  }
  const now = Math.max(finished, ...drawn.map(({samples}) => samples.at(-1)?.date ?? 0));
  const courses = drawn.map(volume => ({volume, points: pointsOf(volume, now, before)}));
  const text = [['historyText', true], ['forecastText', drawn.some(isGrowing)],
                ['jumpText', drawn.some(({forecast}) => forecast.jump)]].filter(
    ([, isThere]) => isThere).map(([key]) => format.say(key)).join(' ');
  return [h('p', {class: 'lead'}, text), drawings(courses, spanOf(courses, now)),
          fold(SAMPLES, format.say('chartData'), () => historyTable(courses))];
}
