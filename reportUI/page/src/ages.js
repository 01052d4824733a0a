// How old the files are: a bar for each share, and what is older than so many years.
import {ageClass, cutBars, legend, stack} from './charts.js';
import {h, shown} from './dom.js';
import {fold} from './folds.js';
import * as format from './format.js';
import {ageName, ageOrder, sizeElement, table, withParts} from './table.js';

const YEAR = 365;
const OLDER = [1, 3, 5];  // years
const MOST_BARS = 15;

// Files and bytes of each age over all shares, from the youngest on, of rows of share, age, files and
// size: [age, bytes, files] each.
function totalsOf(rows) {
  const totals = new Map();
  for (const [, age, files, bytes] of rows) {
    const total = totals.get(age) ?? [age, 0, 0];
    total[1] += Number(bytes) || 0;
    total[2] += Number(files) || 0;
    totals.set(age, total);
  }
  return [...totals.values()].sort(([one], [two]) => ageOrder(one) - ageOrder(two));
}

function shareBars(rows, ages) {
  const shares = new Map();
  for (const [share, age, , bytes] of rows) {
    const sizes = shares.get(share) ?? new Map();
    sizes.set(age, (sizes.get(age) ?? 0) + (Number(bytes) || 0));
    shares.set(share, sizes);
  }
  const sum = sizes => [...sizes.values()].reduce((all, bytes) => all + bytes, 0);
  const sorted = [...shares].map(([share, sizes]) => [share, sizes, sum(sizes)]).sort((one, two) => two[2] - one[2]);
  return cutBars(sorted.filter(([, , total]) => total > 0), MOST_BARS, some => h('div', {}, ...some.map(
    ([share, sizes, total]) => h('div', {class: 'stackrow'}, h('span', {class: 'who long'}, shown(share)),
      stack(ages.map(age => [ageClass(age), ageName(age), sizes.get(age) ?? 0]), total),
      h('span', {class: 'amount'}, sizeElement(total, null))))));
}

function olderLines(totals, hasOldest) {
  const all = totals.reduce((sum, [, bytes]) => sum + bytes, 0);
  const lines = OLDER.map(years => [years, totals.filter(
    ([age]) => ageOrder(age) >= years * YEAR && ageOrder(age) < Infinity).reduce((sum, [, bytes]) => sum + bytes, 0)]);
  return all > 0 ? h('ul', {class: 'older'}, ...lines.filter(([, bytes]) => bytes > 0).map(([years, bytes]) => h('li', {},
    h('span', {}, format.days(years * YEAR)), h('b', {}, sizeElement(bytes, null)),
    h('span', {class: 'soft'}, format.percent(bytes / all * 100)))),
    hasOldest ? h('li', {class: 'way'}, h('a', {href: '#least_modify'}, format.say('toOldest'))) : null) : null;
}

// `rows`: share, age, files, bytes. `hasOldest`: the page lists the oldest files.
export function ages(rows, {heading, csv, hasOldest}) {
  const totals = totalsOf(rows);
  const known = totals.map(([age]) => age);
  const [columns, lines] = withParts([['age', 'age'], ['size', 'size', {bar: true, sum: true}],
                                      ['files', 'count', {sum: true, low: true}]],
    totals.map(total => total.map(String)), 1);
  const [key, caption] = ['file_age.share', format.say('byShare', {name: heading})];
  const details = fold(key, caption, () => table(
    [['share', 'name'], ['age', 'age'], ['size', 'size', {bar: true, sum: true}], ['files', 'count', {low: true}]],
    rows.map(([share, age, files, bytes]) => [share, age, bytes, files]), {key, caption}));
  return [olderLines(totals, hasOldest), h('figure', {}, legend(known.map(
    age => [ageClass(age), ageName(age)])), ...shareBars(rows, known)),
  table(columns, lines, {key: 'file_age', caption: heading, csv}), details];
}
