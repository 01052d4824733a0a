// Whose the files are, and where each one's lie.
import {fold} from './folds.js';
import * as format from './format.js';
import {table, withParts} from './table.js';

// As the facts have them, of rows of owner, share, files and size.
function ownersOf(rows) {
  const owners = new Map();
  for (const [name, share, files, bytes] of rows) {
    const owner = owners.get(name) ?? {name, files: 0, bytes: 0, places: []};
    owner.files += Number(files) || 0;
    owner.bytes += Number(bytes) || 0;
    owner.places.push({share, files: Number(files) || 0, bytes: Number(bytes) || 0});
    owners.set(name, owner);
  }
  return [...owners.values()].sort((one, two) => two.bytes - one.bytes);
}

function placesTable(owner) {
  const isOnVolumes = owner.places.some(({volume}) => volume);
  const [columns, rows] = withParts(
    [['share', 'name'], ['size', 'size', {bar: true, sum: true}], ['files', 'count', {low: true}],
     ...isOnVolumes ? [['volume', 'text', {low: true}]] : []],
    owner.places.map(({share, volume, files, bytes}) => [
      share, String(bytes), String(files), ...isOnVolumes ? [volume] : []]), 1);
  return table(columns, rows, {key: `file_owner.${owner.name}`, caption: owner.name});
}

// Sums of all owners by what a place says of itself.
function sumsBy(owners, key, caption) {
  const sums = new Map();
  for (const {name, places} of owners) {
    for (const {[key]: place, bytes} of places) {
      const sum = sums.get(place) ?? {total: 0, owners: new Map()};
      sum.total += bytes;
      sum.owners.set(name, (sum.owners.get(name) ?? 0) + bytes);
      sums.set(place, sum);
    }
  }
  const rows = [...sums].flatMap(([place, {total, owners: all}]) => [...all].map(
    ([name, bytes]) => [place, name, String(bytes), String(bytes / total * 100)]))
    .sort((one, two) => two[2] - one[2]);
  const name = `file_owner.by-${key}`;
  return fold(name, caption, () => table(
    [[key, 'name'], ['owner', 'text'], ['size', 'size', {bar: true}], ['part', 'part']],
    rows, {key: name, caption, sorted: 2}));
}

// `rows`: owner, share, files, bytes.
export function owners(rows, facts, {heading, csv}) {
  const all = facts?.owners ?? ownersOf(rows);
  const grows = all.some(({grown}) => grown?.month ?? grown?.week);
  const [columns, lines] = withParts(
    [['owner', 'name'], ['size', 'size', {bar: true, sum: true}], ['files', 'count', {sum: true, low: true}],
     ...grows ? [['inWeek', 'change', {low: true}], ['inMonth', 'change', {sum: true}]] : []],
    all.map(({name, bytes, files, grown}) => [
      name, String(bytes), String(files), ...grows ? [String(grown?.week?.bytes ?? ''),
        String(grown?.month?.bytes ?? '')] : []]), 1);
  const named = new Map(all.map(owner => [owner.name, owner]));
  const isOnVolumes = all.some(({places}) => places.some(({volume}) => volume));
  return [table(columns, lines, {key: 'file_owner', caption: heading, csv, sorted: 1,
                                 detail: {name: ([name]) => name, make: ([name]) => placesTable(named.get(name))}}),
          sumsBy(all, 'share', format.say('byShare', {name: heading})),
          isOnVolumes ? sumsBy(all, 'volume', format.say('byVolume', {name: heading})) : null];
}
