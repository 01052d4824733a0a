// What the drawings share: width of the place they stand in, labels that fit, legends, and the small
// line of a volume or share.
import {area, line} from 'd3-shape';
import {scaleLinear} from 'd3-scale';

import {h, svg} from './dom.js';
import * as format from './format.js';

// The widths of a label's characters at most.
const CHARACTER = 7.4, CAPITAL = 10.2, WIDE = 13.5;
const widthOf = character => character > '\u1100' ? WIDE :
  /[\p{Lu}\p{M}@%_]/u.test(character) ? CAPITAL : CHARACTER;

// `text` as far as there is room for it: cut behind a whole character, or '' when little would stay.
export function fit(text, width) {
  const characters = [...text];
  let used = 0, kept = 0;
  for (let i = 0; i < characters.length; ++i) {
    used += widthOf(characters[i]);
    if (used > width) {
      return kept < 3 ? '' : `${characters.slice(0, kept).join('')}…`;
    }
    kept += used + CHARACTER <= width;
  }
  return text;
}

// A number that is cut says something else.
export const fitWhole = (text, width) => fit(text, width) === text ? text : '';

const drawers = new Map();
const watcher = new ResizeObserver(entries => entries.forEach(({target, contentRect: {width}}) => {
  const drawer = drawers.get(target);
  if (width && Math.round(width) !== drawer.width) {
    drawer.width = Math.round(width);
    drawer.draw(drawer.width);
  }
}));

// A print is laid out without a word of the widths in it.
window.addEventListener('beforeprint', () => drawers.forEach(({draw, paper}) => draw(paper)));
window.addEventListener('afterprint', () => drawers.forEach(({draw, width}) => width && draw(width)));

// `element`, in which `draw` is called with its width, and again whenever that changes; `paper`: its
// width in print.
export function drawnIn(element, draw, paper) {
  drawers.set(element, {draw, paper});
  watcher.observe(element);
  return element;
}
export function forgetDrawings() {
  watcher.disconnect();
  drawers.clear();
}

// Entries of [class, text]; `what` they say, if that isn't clear.
export const legend = (entries, what) => h('div', {class: 'legend'}, what ? h('span', {}, `${what}:`) : null,
  h('ul', {}, ...entries.map(([name, text]) => h('li', {class: name}, text))));

// What `draw` makes of the first `most` of a list, and how many more there are; one more has the room
// that saying so would take.
export function cutBars(list, most, draw) {
  const count = list.length > most + 1 ? most : list.length;
  return [draw(list.slice(0, count)), count < list.length ? h('p', {class: 'cut'}, format.say(
    'andMore', {n: format.number(list.length - count)})) : null];
}

// The ages of files as their report has them, and the colour of each, which is the same in all drawings.
export const AGES = ['0-7', '7-30', '30-90', '90-365', '365-1095', '1095-1825', '1825-'];
export const ageClass = age => AGES.includes(age) ? `age${AGES.indexOf(age)}` : 'noage';

// A bar of parts, [class, text of what it is, bytes] each, with a gap between them.
export function stack(parts, total) {
  const bar = h('div', {class: 'stack', 'aria-hidden': 'true'});
  for (const [name, what, bytes] of parts) {
    if (bytes > 0) {
      const part = h('span', {class: name, title: format.say('selected', {
        name: what, size: format.size(bytes), percent: format.percent(bytes / total * 100)})});
      part.style.flexGrow = bytes;
      bar.append(part);
    }
  }
  return bar;
}

const DAY = 86400;
const PAST = 90;
const LEAST_SPAN = .05;  // of the size, from the lowest to the highest

// The samples of 90 days as a line, `samples` of {date, used}; where `forecast` is growing, with its
// way to `size`. `limit` draws the line of a full volume.
export function sparkline(samples, {width, height, now, size = 0, forecast, limit = false, level = ''}) {
  const last = samples.at(-1);
  if (!last || samples.length < 2) {
    return null;
  }
  const {days, days_low: low = days, days_high: high = days} = forecast ?? {};
  const grows = forecast?.state === 'growing' && days !== undefined;
  const ahead = grows ? Math.min(high * 1.05, PAST * .6) : 0;
  const x = scaleLinear([now - PAST * DAY, now + Math.max(ahead, PAST * .04) * DAY], [1, width - 1]);
  const uses = samples.map(({used}) => used);
  const [least, most] = [Math.min(...uses), Math.max(...uses, limit ? size : 0)];
  // What hardly moves is drawn flat, in the middle.
  const span = Math.max(most - least, (size || most) * LEAST_SPAN), middle = (least + most) / 2;
  // At the top is a full volume; one whose fill isn't in the drawing must not look full.
  const headroom = limit ? 0 : size ? .8 : .05;
  const y = scaleLinear([Math.max(0, middle - span * .68), middle + span * (.5 + headroom) || 1], [height - 2, 3]);
  const path = line(({date}) => x(Math.max(date, now - PAST * DAY)), ({used}) => y(used));
  const below = area(({date}) => x(Math.max(date, now - PAST * DAY)), height, ({used}) => y(used));
  const drawing = svg('svg', {class: `spark ${level}`, viewBox: `0 0 ${width} ${height}`,
                              'aria-hidden': 'true'});
  drawing.append(svg('path', {class: 'below', d: below(samples)}));
  if (limit) {
    drawing.append(svg('line', {class: 'limit', x1: 0, x2: width, y1: y(size), y2: y(size)}));
  }
  if (grows) {
    const to = count => {
      const share = Math.min(1, ahead / Math.max(count, .5));
      return {date: last.date + Math.max(count, .5) * share * DAY,
              used: last.used + (size - last.used) * share};
    };
    const [soon, late] = [to(low), to(high)];
    drawing.append(
      svg('path', {class: 'range', d: `${path([last, soon, {date: late.date, used: soon.used}, late])}Z`}),
      svg('path', {class: 'forecast', d: path([last, to(days)])}));
  }
  drawing.append(svg('path', {class: 'past', d: path(samples)}),
                 svg('circle', {r: 2.6, cx: x(last.date), cy: y(last.used)}));
  return drawing;
}
