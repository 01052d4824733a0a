// Drawings of sizes: shares as a treemap, file types as stacked bars.
import {hierarchy, treemap} from 'd3-hierarchy';
import {scaleLinear} from 'd3-scale';

import {h, shown, shownPlain, svg} from './dom.js';
import * as format from './format.js';
import {sizeElement, typeName} from './table.js';

const WIDTH = 1180, HEIGHT = 340, HEADER = 22;
// The widths of a label's characters at most, in the drawing's units.
const CHARACTER = 7.4, CAPITAL = 10.2, WIDE = 13.5;
const LINE = 17;

const widthOf = character => character > '\u1100' ? WIDE :
  /[\p{Lu}\p{M}@%_]/u.test(character) ? CAPITAL : CHARACTER;

// `text` as far as there is room for it: cut behind a whole character, or '' when little would stay.
function fit(text, width) {
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
const fitWhole = (text, width) => fit(text, width) === text ? text : '';

// The leaf that lies nearest in the direction of an arrow key.
function neighbour(leaves, from, key) {
  const [dx, dy] = {ArrowLeft: [-1, 0], ArrowRight: [1, 0], ArrowUp: [0, -1],
                    ArrowDown: [0, 1]}[key] ?? [0, 0];
  const middle = leaf => [(leaf.x0 + leaf.x1) / 2, (leaf.y0 + leaf.y1) / 2];
  const [x, y] = middle(from);
  let best, least = Infinity;
  for (const leaf of leaves) {
    const [right, down] = [middle(leaf)[0] - x, middle(leaf)[1] - y];
    const along = right * dx + down * dy;
    const across = Math.abs(right * dy) + Math.abs(down * dx);
    if (along > 0.5 && along + 2 * across < least) {
      [best, least] = [leaf, along + 2 * across];
    }
  }
  return best;
}

function leafElement(leaf, total) {
  const {x0, x1, y0, y1} = leaf;
  const [width, height] = [x1 - x0, y1 - y0];
  const plain = shownPlain(leaf.data.name);
  const label = format.say('selected', {
    name: plain, size: format.size(leaf.value),
    percent: format.percent(leaf.value / total * 100)});
  const element = svg('g', {class: `leaf series${format.seriesOf(leaf.parent.data.name)}`, role: 'img', tabindex: -1,
                            'aria-label': label, transform: `translate(${x0},${y0})`},
                      svg('title', {}, label), svg('rect', {width, height, rx: 2}));
  const lines = [fit(plain, width - 12), fitWhole(format.size(leaf.value), width - 12)];
  lines.forEach((text, i) => {
    if (text && height > LINE * (i + 1) + 6) {
      element.append(svg('text', {x: 7, y: LINE * (i + 1), class: i ? 'amount' : ''}, text));
    }
  });
  return element;
}

// A drawing of rows (share, volume, size): shares in their volumes. One tab stop, in which arrow
// keys move; the line below says what is chosen.
export function shareMap(rows) {
  const volumes = Map.groupBy ? Map.groupBy(rows, row => row[1]) : rows.reduce(
    (groups, row) => groups.set(row[1], [...groups.get(row[1]) ?? [], row]), new Map());
  const root = hierarchy({children: [...volumes].map(([name, shares]) => ({
    name, children: shares.map(([share, , bytes]) => ({name: share, bytes: Number(bytes)}))}))},
                         node => node.children).sum(node => node.bytes || 0)
    .sort((one, two) => two.value - one.value);
  if (!(root.value > 0)) {
    return null;
  }
  treemap().size([WIDTH, HEIGHT]).paddingTop(node => node.depth === 1 ? HEADER : 0)
    .paddingInner(2).round(true)(root);
  const drawing = svg('svg', {class: 'treemap', viewBox: `0 0 ${WIDTH} ${HEIGHT}`, role: 'group',
                              'aria-label': format.nameOf('reports', 'share_list')});
  root.children.forEach(volume => {
    const plain = shownPlain(format.volumeName(volume.data.name));
    const text = `${plain}  ${format.size(volume.value)}`;
    drawing.append(svg('text', {class: 'volume', x: volume.x0 + 2, y: volume.y0 + 15},
                       fitWhole(text, volume.x1 - volume.x0) || fit(plain, volume.x1 - volume.x0)));
    volume.leaves().forEach(leaf => {
      leaf.element = drawing.appendChild(leafElement(leaf, root.value));
    });
  });
  const leaves = root.leaves();
  const chosen = h('p', {class: 'chosen', 'aria-hidden': 'true'}, format.say('treemapHelp'));
  leaves[0].element.setAttribute('tabindex', 0);
  const show = leaf => {
    chosen.textContent = leaf.element.getAttribute('aria-label');
  };
  for (const leaf of leaves) {
    leaf.element.addEventListener('focus', () => show(leaf));
    leaf.element.addEventListener('pointerenter', () => show(leaf));
    leaf.element.addEventListener('keydown', event => {
      const next = neighbour(leaves, leaf, event.key);
      if (event.key.startsWith('Arrow')) {
        event.preventDefault();
      }
      if (next) {
        leaf.element.setAttribute('tabindex', -1);
        next.element.setAttribute('tabindex', 0);
        next.element.focus();
      }
    });
  }
  return h('figure', {}, drawing, chosen);
}

// --- File types ---------------------------------------------------------------------------------

const MOST_TYPES = 7;  // with colours of their own; the rest share one

function bar(name, sizes, types) {
  const total = [...sizes.values()].reduce((sum, bytes) => sum + bytes, 0);
  const x = scaleLinear([0, total || 1], [0, 100]);
  const parts = types.map(type => sizes.get(type) ?? 0);
  parts.push(total - parts.reduce((sum, bytes) => sum + bytes, 0));
  const drawing = svg('svg', {class: 'stack', viewBox: '0 0 100 10', preserveAspectRatio: 'none',
                              'aria-hidden': 'true'});
  let start = 0;
  parts.forEach((bytes, i) => {
    const label = types[i] ? typeName(types[i]) : format.nameOf('types', 'other');
    if (bytes > 0) {
      drawing.append(svg('rect', {class: `series${i}`, x: x(start), width: x(bytes), height: 10},
                         svg('title', {}, format.say('selected', {
                           name: label, size: format.size(bytes),
                           percent: format.percent(bytes / total * 100)}))));
    }
    start += bytes;
  });
  return h('div', {class: 'stackrow'}, h('span', {class: 'who'}, name), drawing,
           h('span', {class: 'amount'}, sizeElement(total)));
}

// Stacked bars of tables (Map of user to rows of type, share and size), the same colours in all.
export function typeBars(tables) {
  const sums = new Map();
  for (const [user, rows] of tables) {
    const sizes = new Map();
    for (const [type, , bytes] of rows) {
      sizes.set(type, (sizes.get(type) ?? 0) + (Number(bytes) || 0));
    }
    sums.set(user, sizes);
  }
  const all = sums.get('vornAll') ?? [...sums.values()][0];
  const types = [...all].sort((one, two) => two[1] - one[1]).map(([type]) => type)
    .filter(type => !type.endsWith('_other')).slice(0, MOST_TYPES);
  const legend = h('ul', {class: 'legend'}, ...types.concat('other').map((type, i) => h(
    'li', {class: `series${types[i] ? i : types.length}`}, typeName(type))));
  return h('figure', {}, legend, ...[...sums].map(([user, sizes]) => bar(
    user === 'vornAll' ? format.say('allFiles') : shown(user), sizes, types)));
}
