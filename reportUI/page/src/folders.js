// The folders as a treemap to go into: volumes, their shares, and the folders in those. What lies on
// a volume besides its shares, and what is free there, is drawn as well.
import {hierarchy, treemap} from 'd3-hierarchy';

import {ageClass, AGES, drawnIn, fit, fitWhole, legend} from './charts.js';
import {fileAddress, h, shown, shownPlain, svg} from './dom.js';
import * as format from './format.js';
import {keep, stateOf} from './state.js';
import {ageName, copyButton, table} from './table.js';

const HEADER = 20, LINE = 16;
const LEAST = 6;  // pixels that a box needs to be drawn
const MOST_BOXES = 400;
const PAPER = 700;  // pixels
const DAY = 86400;

// The number of the age of a last change.
function ageNumber(newest, now) {
  const days = (now - newest) / DAY;
  return newest > 0 ? AGES.findLastIndex(age => days >= parseInt(age, 10)) : -1;
}
const ageLegend = () => legend(AGES.map(age => [ageClass(age), ageName(age)]), format.nameOf('columns', 'newest'));

// --- The tree -----------------------------------------------------------------------------------

// {name, kind, bytes, files, newest, path, children}: of the whole server, from rows of share,
// folder, bytes, files and newest, and rows of share and volume.
function treeOf(rows, shareRows, facts) {
  const volumes = new Map(), shares = new Map();
  const volumeOf = name => {
    if (!volumes.has(name)) {
      volumes.set(name, {name, kind: 'volume', path: name, children: []});
    }
    return volumes.get(name);
  };
  const known = facts?.shares?.map(({name, volume, bytes, files, path}) => [name, volume, bytes, files, path]) ??
    shareRows.map(([name, id, bytes]) => [name, format.volumeName(id), Number(bytes) || 0, 0, '']);
  for (const [name, volume, bytes, files, path] of known) {
    shares.set(name, {name, kind: 'share', share: name, path, bytes, files, children: [], below: new Map()});
    volumeOf(volume).children.push(shares.get(name));
  }
  const elsewhere = [];  // shares of which nothing else is known
  addFolders(rows, shares, elsewhere);
  elsewhere.forEach(share => volumeOf(format.UNKNOWN).children.push(share));
  for (const {path, free, outside} of facts?.volumes ?? []) {
    if (volumes.has(path)) {
      volumes.get(path).children.push(
        {name: format.nameOf('columns', 'outside'), kind: 'outside', bytes: Math.max(0, outside ?? 0)},
        {name: format.say('free'), kind: 'free', bytes: free});
    }
  }
  for (const volume of volumes.values()) {
    volume.bytes = volume.children.reduce((sum, {bytes}) => sum + bytes, 0);
  }
  return {name: format.say('allVolumes'), kind: 'all', children: [...volumes.values()]};
}

// Parents are always there; with shorter names they come first here.
function addFolders(rows, shares, elsewhere) {
  for (const [name, folder, bytes, files, newest] of rows.toSorted((one, two) => one[1].length - two[1].length)) {
    if (!shares.has(name)) {
      shares.set(name, {name, kind: 'share', share: name, bytes: 0, files: 0, children: [], below: new Map()});
      elsewhere.push(shares.get(name));
    }
    const share = shares.get(name);
    const node = {share: name, kind: 'folder', folder, bytes: Number(bytes) || 0, files: Number(files) || 0,
                  newest: Number(newest) || 0, children: []};
    if (folder === '.') {
      share.newest = node.newest;
      share.bytes ||= node.bytes;
      continue;
    }
    const parent = share.below.get(folder.slice(0, Math.max(0, folder.lastIndexOf('/')))) ?? share;
    node.name = parent === share ? folder : folder.slice(parent.folder.length + 1);
    node.path = share.path && `${share.path}/${folder}`;
    share.below.set(folder, node);
    parent.children.push(node);
  }
}

// What of a node isn't in the folders that the report knows.
function rest(node) {
  const known = node.children.reduce((sum, {bytes}) => sum + bytes, 0);
  return node.children.length && node.bytes > known ?
    [{name: format.say('ownFiles'), kind: 'rest', bytes: node.bytes - known, children: []}] : [];
}
const childrenOf = node => node.children ? [...node.children, ...['share', 'folder'].includes(node.kind) ?
  rest(node) : []] : [];
const canEnter = ({children, kind}) => kind !== 'all' && children?.length > 0;

// --- The drawing --------------------------------------------------------------------------------

// The way from the top to where a reader begins: the volume `name`, or the only one; and where its
// shares are too small a part of it to be seen, the largest of them.
function beginning(tree, name) {
  const LEAST_PART = .15;
  const volume = tree.children.find((each, i, all) => all.length === 1 || each.name === name);
  const shares = volume?.children.filter(({kind}) => kind === 'share') ?? [];
  const largest = shares.toSorted((one, two) => two.bytes - one.bytes)[0];
  const isSeen = shares.reduce((sum, {bytes}) => sum + bytes, 0) >= volume?.bytes * LEAST_PART;
  return [tree, ...volume ? [volume] : [], ...largest && !isSeen && canEnter(largest) ? [largest] : []];
}

// The box that lies nearest in the direction of an arrow key.
function neighbour(boxes, from, key) {
  const [dx, dy] = {ArrowLeft: [-1, 0], ArrowRight: [1, 0], ArrowUp: [0, -1],
                    ArrowDown: [0, 1]}[key] ?? [0, 0];
  const middle = box => [(box.x0 + box.x1) / 2, (box.y0 + box.y1) / 2];
  const [x, y] = middle(from);
  let best, least = Infinity;
  for (const box of boxes) {
    const [right, down] = [middle(box)[0] - x, middle(box)[1] - y];
    const along = right * dx + down * dy;
    const across = Math.abs(right * dy) + Math.abs(down * dx);
    if (along > 0.5 && along + 2 * across < least) {
      [best, least] = [box, along + 2 * across];
    }
  }
  return best;
}

// The place and two levels below it, laid out for a width.
function layOut(place, width) {
  const root = hierarchy(place, node => {
    const depth = node === place ? 0 : place.children?.includes(node) ? 1 : 2;
    return depth < 2 ? childrenOf(node) : null;
  });
  root.each(node => { node.value = node.data.bytes ?? 0; });
  root.eachAfter(node => {
    if (node.children) {
      node.value = node.children.reduce((sum, {value}) => sum + value, 0);
    }
  });
  root.sort((one, two) => two.value - one.value);
  const height = Math.max(260, Math.min(440, width * .42));
  treemap().size([width, height]).paddingInner(2).round(true)
    .paddingTop(node => node.depth === 1 && node.children ? HEADER : 0)(root);
  return {root, height};
}

class Treemap {
  constructor(tree, {now, key, first, entered}) {
    Object.assign(this, {tree, now, key, entered});
    this.trail = h('p', {class: 'trail'});
    this.chosen = h('p', {class: 'chosen', 'aria-hidden': 'true'});
    this.place = drawnIn(h('div', {class: 'place'}), width => this.draw(width), PAPER);
    this.element = h('figure', {class: 'folders'}, this.trail, ageLegend(), this.place, this.chosen);
    this.way = [tree];
    for (const name of stateOf(key).split('\n').filter(Boolean)) {
      const next = this.way.at(-1).children.find(child => child.name === name);
      if (next) {
        this.way.push(next);
      }
    }
    if (!stateOf(key)) {
      this.way = beginning(tree, first);
    }
    this.go(this.way);
  }

  go(way, isMove = false) {
    this.way = way;
    if (isMove) {
      keep(this.key, way.slice(1).map(({name}) => name).join('\n') || '\n', this.key.replace(/\..*/, ''));
    }
    const last = way.at(-1);
    this.trail.replaceChildren(...way.flatMap((node, i) => {
      const text = shown(node.kind === 'volume' ? shownPlain(node.name) : node.name);
      if (node === last) {
        return [h('b', {}, text)];
      }
      const button = h('button', {type: 'button'}, text);
      button.addEventListener('click', () => this.go(way.slice(0, i + 1), true));
      return [button, ' › '];
    }), ' ', h('span', {class: 'amount'}, last.bytes === undefined ? '' : format.size(last.bytes)),
    ...last.path ? [copyButton(last.path), ...location.protocol === 'file:' && last.path.startsWith('/') ? [
      h('a', {class: 'go', href: fileAddress(last.path)}, format.say('openFolder'))] : []] : []);
    this.chosen.textContent = format.say('treemapHelp');
    if (this.width) {
      this.draw(this.width);
    }
    this.entered(last);
  }

  enter(node) {
    if (canEnter(node)) {
      const above = this.way.at(-1);
      // Drawn are two levels, so there may be one in between.
      const between = above.children.includes(node) ? [] : [above.children.find(
        ({children}) => children?.includes(node))];
      this.go([...this.way, ...between, node], true);
      this.place.querySelector('[tabindex="0"]')?.focus();
    }
  }

  leave() {
    if (this.way.length > 1) {
      this.go(this.way.slice(0, -1), true);
      this.place.querySelector('[tabindex="0"]')?.focus();
    }
  }

  draw(width) {
    this.width = width;
    const {root, height} = layOut(this.way.at(-1), width);
    const drawing = svg('svg', {class: 'treemap', viewBox: `0 0 ${width} ${height}`, role: 'group',
                                'aria-label': format.nameOf('reports', 'folder_usage')});
    const boxes = root.descendants().filter(({depth, x0, x1, y0, y1}) =>
      depth && x1 - x0 >= LEAST && y1 - y0 >= LEAST).slice(0, MOST_BOXES);
    for (const box of boxes) {
      const parts = this.box(box, root.value);
      drawing.append(...parts);
      [box.element] = parts;
    }
    boxes[0]?.element.setAttribute('tabindex', 0);
    boxes.forEach(box => this.listen(box, boxes));
    this.place.replaceChildren(drawing);
  }

  box(box, total) {
    const {x0, x1, y0, y1, data, children, value} = box;
    const [width, height] = [x1 - x0, y1 - y0];
    const plain = shownPlain(data.name);
    const size = format.size(value);
    const age = data.newest ? ` · ${format.nameOf('columns', 'newest')}: ${format.day(data.newest)}` : '';
    const label = format.say('selected', {name: plain, size, percent: format.percent(value / total * 100)}) + age;
    const number = ageNumber(data.newest ?? 0, this.now);
    const kind = ['free', 'outside'].includes(data.kind) ? data.kind : children ? 'group' :
      ageClass(AGES[number]);
    const transform = `translate(${x0},${y0})`;
    const element = svg('g', {class: `box ${kind}${canEnter(data) ? ' way' : ''}`, transform, tabindex: -1,
                              role: canEnter(data) ? 'button' : 'img', 'aria-label': label},
                        svg('title', {}, label), svg('rect', {width, height, rx: 2}));
    // Letters stand beside the button, whose label says more than there is room for.
    const letters = svg('g', {class: `letters ${kind}`, transform, 'aria-hidden': 'true'});
    if (children) {
      const both = `${plain}  ${size}`;
      letters.append(svg('text', {x: 4, y: 14}, fitWhole(both, width - 8) || fit(plain, width - 8)));
    } else {
      [fit(plain, width - 10), fitWhole(size, width - 10)].forEach((text, i) => {
        if (text && height > LINE * (i + 1) + 4) {
          letters.append(svg('text', {x: 5, y: LINE * (i + 1) - 1, class: i ? 'amount' : ''}, text));
        }
      });
    }
    return [element, letters];
  }

  listen(box, boxes) {
    const {element, data} = box;
    const show = () => { this.chosen.textContent = element.getAttribute('aria-label'); };
    element.addEventListener('focus', show);
    element.addEventListener('pointerenter', show);
    element.addEventListener('click', () => this.enter(data));
    element.addEventListener('keydown', event => {
      const {key} = event;
      if (key.startsWith('Arrow')) {
        event.preventDefault();
        const next = neighbour(boxes, box, key);
        if (next) {
          element.setAttribute('tabindex', -1);
          next.element.setAttribute('tabindex', 0);
          next.element.focus();
        }
      } else if (key === 'Enter' || key === ' ') {
        event.preventDefault();
        this.enter(data);
      } else if (key === 'Escape') {
        this.leave();
      }
    });
  }
}

// --- The section --------------------------------------------------------------------------------

const COLUMNS = [['folder', 'place'], ['size', 'size', {bar: true}], ['files', 'count', {low: true}],
                 ['newest', 'time', {low: true}]];

// What lies in the place, from `rows` as they are.
function rowsAt(rows, {kind, share, folder, children}) {
  if (kind === 'all' || !rows.length) {
    return rows;
  }
  if (kind === 'volume') {
    const shares = new Set(children.map(({name}) => name));
    return rows.filter(row => shares.has(row[0]));
  }
  return rows.filter(row => row[0] === share && (kind === 'share' || row[1].startsWith(`${folder}/`)));
}

// The drawing, and the table of the folders where it is. `rows`: share, folder, bytes, files, newest;
// `shareRows`: share, volume, bytes.
export function folders(rows, shareRows, facts, {heading, csv}) {
  const tree = treeOf(rows, shareRows, facts);
  const now = facts?.finished ?? Math.max(0, ...rows.map(row => Number(row[4]) || 0));
  const place = h('div');
  const list = node => {
    const lines = rowsAt(rows, node).map(
      ([share, folder, bytes, files, newest]) => [[share, folder], bytes, files, newest]);
    place.replaceChildren(table(COLUMNS, lines, {key: 'folder_usage', caption: heading, csv, sorted: 1}));
  };
  if (!tree.children.some(({bytes}) => bytes > 0)) {
    list(tree);
    return [place];
  }
  // Where it presses most is what a reader wants to see.
  const first = facts?.shares && facts.volumes[0]?.path;
  return [new Treemap(tree, {now, first, key: 'folder_usage.place', entered: list}).element, place];
}

// The drawing of the shares alone, where nothing is known of folders.
export const shareMap = (shareRows, facts) => {
  const tree = treeOf([], shareRows, facts);
  return tree.children.some(({bytes}) => bytes > 0) ?
    new Treemap(tree, {now: facts?.finished ?? 0, key: 'share_list.place', entered: () => {}}).element : null;
};
