// What kinds of files there are: over all of them and in each share, from the facts; of each user, as
// far as the page has rows.
import {cutBars, legend, stack} from './charts.js';
import {h, shown, shownPlain} from './dom.js';
import {fold} from './folds.js';
import * as format from './format.js';
import {sizeElement, table, typeName, withParts} from './table.js';

const MOST_TYPES = 7;  // with colours of their own; the rest share one
const MOST_SHARES = 15;
const ALL = 'vornAll';  // the table of all files
const OWNERS = 'file_group.owners';

const isOther = type => type.endsWith('_other');
// The number of bytes of each key, of rows.
function sumsOf(rows, keyOf, bytesOf) {
  const sums = new Map();
  for (const row of rows) {
    sums.set(keyOf(row), (sums.get(keyOf(row)) ?? 0) + bytesOf(row));
  }
  return sums;
}
const total = sizes => [...sizes.values()].reduce((sum, bytes) => sum + bytes, 0);

function bar(name, sizes, types) {
  const all = total(sizes);
  const parts = types.map((type, i) => [`series${i}`, typeName(type), sizes.get(type) ?? 0]);
  const rest = all - parts.reduce((sum, [, , bytes]) => sum + bytes, 0);
  return h('div', {class: 'stackrow'}, h('span', {class: 'who long'}, name),
           stack([...parts, ['rest', format.nameOf('types', 'other'), rest]], all),
           h('span', {class: 'amount'}, sizeElement(all, null)));
}

// Types by size, as records of the facts; of the block's rows where there are no facts.
function typesOf(tables, facts) {
  if (facts?.types) {
    return facts.types;
  }
  const rows = tables.get(ALL) ?? [...tables.values()][0] ?? [];
  const types = new Map();
  for (const [type, share, bytes] of rows) {
    const record = types.get(type) ?? {type, files: NaN, bytes: 0, shares: []};
    record.bytes += Number(bytes) || 0;
    record.shares.push({share, bytes: Number(bytes) || 0});
    types.set(type, record);
  }
  return [...types.values()].sort((one, two) => two.bytes - one.bytes);
}

function drawing(records) {
  const types = records.map(({type}) => type).filter(type => !isOther(type)).slice(0, MOST_TYPES);
  const places = records.flatMap(({type, shares}) => shares.map(place => ({...place, type})));
  const shares = [...sumsOf(places, ({share}) => share, ({bytes}) => bytes)].sort((one, two) => two[1] - one[1]);
  const barOf = share => bar(shown(share), sumsOf(
    places.filter(place => place.share === share), ({type}) => type, ({bytes}) => bytes), types);
  return h('figure', {}, legend([...types.map((type, i) => [`series${i}`, typeName(type)]),
                                 ['rest', format.nameOf('types', 'other')]]),
    bar(format.say('allFiles'), new Map(records.map(({type, bytes}) => [type, bytes])), types),
    ...shares.length > 1 ? cutBars(shares, MOST_SHARES, some => h('div', {}, ...some.map(
      ([share]) => barOf(share)))) : []);
}

function userTable(name, rows) {
  const caption = name === ALL ? format.say('allFiles') : shownPlain(name);
  const key = `${OWNERS}.${name}`;
  return fold(key, caption, () => table(
    [['type', 'type'], ['share', 'text'], ['size', 'size', {bar: true, sum: true}]],
    rows.toSorted((one, two) => (Number(two[2]) || 0) - (Number(one[2]) || 0)), {key, caption, sorted: 2}));
}

// `tables`: Map of user to rows of type, share and size; `cut`: a note that these lack some, if they do.
export function types(tables, facts, {heading, cut}) {
  const records = typesOf(tables, facts);
  const grows = records.some(({grown}) => grown?.month);
  const [columns, rows] = withParts(
    [['type', 'type'], ['size', 'size', {bar: true, sum: true}],
     ...facts?.types ? [['files', 'count', {sum: true, low: true}]] : [],
     ...grows ? [['inMonth', 'change', {sum: true}]] : []],
    records.map(({type, bytes, files, grown}) => [
      type, String(bytes), ...facts?.types ? [String(files)] : [],
      ...grows ? [String(grown?.month?.bytes ?? '')] : []]), 1);
  return [drawing(records), table(columns, rows, {key: 'file_group', caption: heading, sorted: 1}),
          fold(OWNERS, format.say('byOwner', {name: heading}), () => h('div', {}, cut,
            ...[...tables].filter(([, all]) => all.length).map(([name, all]) => userTable(name, all))))];
}
