// What grew and what shrank: bars to both sides of nothing, for shares, folders, owners and types.
import {cutBars} from './charts.js';
import {h, shown} from './dom.js';
import {fold} from './folds.js';
import * as format from './format.js';
import {keep, stateOf} from './state.js';
import {sizeElement, table, typeName} from './table.js';

const MOST = 8;  // bars of each kind
const ROWS = 'growth.rows';
const SINCE = {month: 'sinceMonth', week: 'sinceWeek', last: 'sinceLast'};
const GROWN = {share: 'grownShare', owner: 'grownOwner', type: 'grownType', folder: 'grownFolder',
               folder_at_least: 'grownAtLeast'};
const KINDS = {share: 'share_list', folder: 'folder_usage', owner: 'file_owner', type: 'file_group'};
const sayOf = (texts, word) => Object.hasOwn(texts, word) ? format.say(texts[word]) : word;

// Changes of one kind, the greatest either way first: [name, bytes, at least].
function changesOf(kind, since, rows, facts) {
  const records = {share: facts?.shares, owner: facts?.owners, type: facts?.types}[kind];
  if (records) {
    return records.filter(({grown}) => grown?.[since]?.bytes).map(
      record => [kind === 'type' ? typeName(record.type) : record.name, record.grown[since].bytes]);
  }
  const sums = new Map();
  for (const [when, what, share, name, , bytes] of rows) {
    if (when === since && (what === kind || what === `${kind}_at_least`)) {
      const text = kind === 'folder' ? name === '.' ? share : `${share}/${name}` :
        kind === 'share' ? share : kind === 'type' ? typeName(name) : name;
      sums.set(text, (sums.get(text) ?? 0) + (Number(bytes) || 0));
    }
  }
  return [...sums];
}

function bars(heading, changes) {
  const sorted = changes.sort(([, one], [, two]) => Math.abs(two) - Math.abs(one));
  const most = Math.max(1, ...sorted.map(([, bytes]) => Math.abs(bytes)));
  const line = ([name, bytes]) => {
    const bar = h('span', {class: bytes < 0 ? 'less' : 'more-of', 'aria-hidden': 'true'});
    bar.style.inlineSize = `${Math.abs(bytes) / most * 50}%`;
    return h('li', {}, h('span', {class: 'long'}, shown(name)),
             h('span', {class: 'sides'}, bar), sizeElement(bytes, null, format.sizeChange(bytes)));
  };
  return sorted.length ? h('div', {class: 'growth-kind'}, h('h3', {}, heading), ...cutBars(
    sorted, MOST, some => h('ul', {}, ...some.map(line)))) : null;
}

function choice(sinces, chosen, change) {
  const group = h('fieldset', {class: 'choice'}, h('legend', {}, format.nameOf('columns', 'since')));
  for (const since of sinces) {
    const input = h('input', {type: 'radio', name: 'since', value: since, checked: since === chosen});
    input.addEventListener('change', () => change(since));
    group.append(h('label', {}, input, h('span', {}, sayOf(SINCE, since))));
  }
  return group;
}

// `rows`: since, kind, share, name, files, bytes.
export function growth(rows, facts, {heading, csv}) {
  const sinces = Object.keys(SINCE).filter(since => rows.some(row => row[0] === since));
  const place = h('div', {class: 'growths'});
  const draw = since => place.replaceChildren(...Object.entries(KINDS).map(([kind, report]) => bars(
    format.nameOf('nav', report), changesOf(kind, since, rows, facts))).filter(Boolean));
  const chosen = sinces.includes(stateOf('growth.since')) ? stateOf('growth.since') : sinces[0];
  draw(chosen);
  return [sinces.length ? choice(sinces, chosen, since => {
    keep('growth.since', since, 'growth');
    draw(since);
  }) : null, place, fold(ROWS, format.say('chartData'), () => growthTable(rows, heading, csv))];
}

function growthTable(rows, heading, csv) {
  const lines = rows.map(([since, kind, share, name, files, bytes]) => [
    sayOf(SINCE, since), sayOf(GROWN, kind), share, kind === 'type' ? typeName(name) : name, bytes, files]);
  return table([['since', 'text', {low: true}], ['kind', 'text', {low: true}], ['share', 'name'], ['name', 'text'],
                ['grown', 'change'], ['filesGrown', 'countChange', {low: true}]],
               lines, {key: ROWS, caption: heading, csv});
}
