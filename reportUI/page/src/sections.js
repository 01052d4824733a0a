// The reports of the page, in its order. To add one: name it here, with its heading and new column
// names in every dictionary. Its variable, columns and limit are the program's.
//
//   always    without a block the report has failed: it has no way to have no rows
//   missing   what is said without a block, in place of that
//   empty     what is said of no rows, by the facts
//   cut       what is said when the page lacks rows of it
//   mode      a variable whose value chooses the heading
//   show      the section's content, a list of elements, from what was read: {tables, heading, csv}
//             (`csv`: address of the file with its rows) and the facts
import {reports as FORMATS} from 'report_format';

import {shareMap, typeBars} from './charts.js';
import {h, shownPlain} from './dom.js';
import * as format from './format.js';
import {history} from './history.js';
import {outlookOrder, outlookText} from './outlook.js';
import {table, typeName} from './table.js';
import {levelElement} from './volumes.js';

const FILES = [['file', 'path'], ['size', 'size'], ['changed', 'time'], ['share', 'text']];

const rowsOf = ({tables}) => [...tables.values()].flat();
const pick = (rows, ...order) => rows.map(row => order.map(index => row[index]));

const bySize = (rows, index) => rows.toSorted(
  (one, two) => (parseFloat(two[index]) || 0) - (parseFloat(one[index]) || 0));

const folded = (summary, content) => h('details', {}, h('summary', {}, summary), content);

// Owner, files and size over all shares, of rows of owner, share, files and size.
function totalsOf(rows) {
  const totals = new Map();
  for (const [owner, , files, bytes] of rows) {
    const total = totals.get(owner) ?? [owner, 0, 0];
    total[1] += Number(files) || 0;
    total[2] += Number(bytes) || 0;
    totals.set(owner, total);
  }
  return bySize([...totals.values()].map(total => total.map(String)), 2);
}

// The groups of duplicates: {number, size, files, frees}. A file that two shares hold in common is
// one file.
function groupsOf(rows) {
  const groups = new Map();
  for (const [number, , file, size] of rows) {
    const group = groups.get(number) ?? {number, size, files: new Set()};
    group.files.add(file);
    groups.set(number, group);
  }
  return [...groups.values()].map(group => ({
    ...group,
    frees: format.isNumber(group.size) ? BigInt(group.size) * BigInt(group.files.size - 1) : 0n}));
}

function showDuplicates(data) {
  const rows = rowsOf(data);
  const groups = groupsOf(rows).sort((one, two) => two.frees > one.frees ? 1 :
    two.frees < one.frees ? -1 : 0);
  return [
    table([['group', 'count'], ['file', 'name'], ['copies', 'count'], ['size', 'size'],
           ['frees', 'size']],
          groups.map(({number, files: [file], size, files, frees}) => [
            number, file.slice(file.lastIndexOf('/') + 1), String(files.size), size,
            String(frees)]),
          {caption: format.say('reclaim'), sorted: 4}),
    table([['group', 'count'], ...FILES], pick(rows, 0, 2, 3, 4, 1),
          {caption: data.heading, csv: data.csv})];
}

// A row for each volume of the block; what becomes of it, and how it is called, say the facts.
function usageTable(data, facts) {
  const known = new Map(facts?.volumes.map(volume => [volume.id, volume]));
  const rows = rowsOf(data).map(([id, used, free]) => {
    const [one, two] = [used, free].map(text => format.isNumber(text) ? Number(text) : NaN);
    const volume = known.get(id);
    return [format.volumeName(id), String(one / (one + two) * 100), used, free, {
      text: volume ? outlookText(volume) : format.UNKNOWN,
      order: volume ? outlookOrder(volume) : NaN}];
  });
  const columns = [['volume', 'name'], ['percent', 'percent'], ['used', 'size'], ['free', 'size']];
  return table(facts ? [...columns.slice(0, 2), ['days', 'outlook'], ...columns.slice(2)] : columns,
               pick(bySize(rows, 1), ...facts ? [0, 1, 4, 2, 3] : [0, 1, 2, 3]),
               {caption: format.nameOf('reports', 'volume_usage'), csv: data.csv, sorted: 1});
}

// What is used on each volume, and how much of it the shares hold.
function explainedTable(facts) {
  const ofIndex = new Set(facts.shares?.filter(({index}) => index).map(({volume}) => volume));
  const volumes = facts.volumes.filter(({explained}) => explained !== undefined);
  const rows = volumes.map(({path, used, explained, outside}) => [
    path, String(used), String(explained),
    {text: outside < 0 ? format.say('outsideLess') : format.size(outside), order: outside}]);
  return rows.length ? [
    table([['volume', 'name'], ['used', 'size'], ['explained', 'size'], ['outside', 'outlook']], rows,
          {caption: format.say('volumes')}),
    ...volumes.filter(({path}) => ofIndex.has(path)).map(
      ({path}) => h('p', {class: 'note'}, format.say('partlyByIndex', {name: shownPlain(path)})))] : [];
}

// Files and bytes of each age over all shares, of rows of share, age, files and size.
function ageTotals(rows) {
  const totals = new Map();
  for (const [, age, files, bytes] of rows) {
    const total = totals.get(age) ?? [0, 0];
    totals.set(age, [total[0] + (Number(files) || 0), total[1] + (Number(bytes) || 0)]);
  }
  // From the youngest on; what is in the future has no number.
  const order = age => Number.isNaN(parseInt(age, 10)) ? Infinity : parseInt(age, 10);
  return [...totals].sort(([one], [two]) => order(one) - order(two)).map(
    ([age, [files, bytes]]) => [ageName(age), String(bytes), String(files)]);
}
const ageName = age => age === 'future' ? format.say('future') : age.replace('-', '–');

const SINCE = {last: 'sinceLast', week: 'sinceWeek', month: 'sinceMonth'};
const GROWN = {share: 'grownShare', owner: 'grownOwner', type: 'grownType', folder: 'grownFolder',
               folder_at_least: 'grownAtLeast'};
const sayOf = (texts, word) => Object.hasOwn(texts, word) ? format.say(texts[word]) : word;

function growthTable(data) {
  const rows = rowsOf(data).map(([since, kind, share, name, files, bytes]) => [
    sayOf(SINCE, since), sayOf(GROWN, kind), share, kind === 'type' ? typeName(name) : name, bytes,
    files]);
  return table([['since', 'text'], ['kind', 'text'], ['share', 'name'], ['name', 'text'],
                ['grown', 'change'], ['filesGrown', 'countChange']],
               rows, {caption: data.heading, csv: data.csv});
}

export const REPORTS = {
  volume_usage: {
    always: true,
    show: (data, facts) => [...facts ? history(facts.volumes, facts.finished) : [],
                            usageTable(data, facts)]
  },
  share_list: {
    show: data => {
      const rows = rowsOf(data).map(([share, id, bytes]) => [share, bytes, format.volumeName(id)]);
      return [shareMap(rowsOf(data)),
              table([['share', 'name'], ['size', 'size'], ['volume', 'text']], rows,
                    {caption: data.heading, csv: data.csv, sorted: 1})];
    }
  },
  file_group: {
    cut: 'cutRows',
    show: ({tables}) => [typeBars(tables), ...[...tables].filter(([, rows]) => rows.length).map(
      ([name, rows]) => folded(name === 'vornAll' ? format.say('allFiles') : shownPlain(name), table(
        [['type', 'type'], ['share', 'text'], ['size', 'size']], bySize(rows, 2),
        {caption: name === 'vornAll' ? format.say('allFiles') : shownPlain(name), sorted: 2})))]
  },
  file_owner: {
    show: data => [
      table([['owner', 'name'], ['size', 'size'], ['files', 'count']],
            pick(totalsOf(rowsOf(data)), 0, 2, 1),
            {caption: data.heading, csv: data.csv, sorted: 1}),
      folded(format.say('byShare'), table(
        [['owner', 'name'], ['share', 'text'], ['size', 'size'], ['files', 'count']],
        pick(rowsOf(data), 0, 1, 3, 2), {caption: format.say('byShare')}))]
  },
  quota_usage: {
    always: true,
    missing: 'noQuotas',
    cut: 'smallestUsers',
    show: ({tables}) => [...tables].filter(([, rows]) => rows.length).map(([id, rows]) => table(
      [['user', 'name'], ['percent', 'percent'], ['used', 'size'], ['quota', 'quota']],
      pick(bySize(rows, 3), 0, 3, 2, 1), {caption: shownPlain(format.volumeName(id)), sorted: 1}))
  },
  duplicate_file: {
    cut: 'firstGroups',
    mode: 'vornDuplicateHashMatch',
    show: showDuplicates
  },
  large_file: {
    show: data => [table(
      [['file', 'path'], ['size', 'size'], ['share', 'text']], pick(rowsOf(data), 1, 2, 0),
      {caption: data.heading, csv: data.csv, sorted: 1})]
  },
  least_modify: {
    show: data => [table(FILES, pick(rowsOf(data), 1, 2, 3, 0),
                         {caption: data.heading, csv: data.csv})]
  },
  most_modify: {
    show: data => [table(FILES, pick(rowsOf(data), 1, 2, 3, 0),
                         {caption: data.heading, csv: data.csv})]
  },
  folder_usage: {
    show: data => [table(
      [['folder', 'name'], ['size', 'size'], ['files', 'count'], ['newest', 'time'],
       ['share', 'text']],
      pick(rowsOf(data), 1, 2, 3, 4, 0), {caption: data.heading, csv: data.csv, sorted: 1})]
  },
  file_age: {
    show: data => [
      table([['age', 'text'], ['size', 'size'], ['files', 'count']], ageTotals(rowsOf(data)),
            {caption: data.heading, csv: data.csv}),
      folded(format.nameOf('columns', 'share'), table(
        [['share', 'name'], ['age', 'text'], ['size', 'size'], ['files', 'count']],
        rowsOf(data).map(([share, age, files, bytes]) => [share, ageName(age), bytes, files]),
        {caption: format.nameOf('columns', 'share')}))]
  },
  growth: {
    empty: facts => facts.volumes.some(volume => volume.grown_by) ? 'nothingGrew' :
      'nothingToCompare',
    show: data => [growthTable(data)]
  },
  coverage: {
    show: (data, facts) => [
      ...facts ? explainedTable(facts) : [],
      table([['volume', 'name'], ['share', 'text'], ['size', 'size'], ['allocated', 'size'],
             ['files', 'count'], ['unreadable', 'count'], ['other', 'count']],
            rowsOf(data).map(([volume, share, files, bytes, allocated, unreadable, other]) => [
              format.volumeName(volume), share, bytes, allocated, files, unreadable, other]),
            {caption: data.heading, csv: data.csv})]
  }
};
for (const {name, variable, columns, has_csv_rows: hasCsv} of FORMATS) {
  Object.assign(REPORTS[name] ?? {}, {variable, columns, hasCsv});
}

const note = (key, values) => h('p', {class: 'note'}, format.say(key, values));

// What is said of a report without a block.
function absence({always, missing, empty}, facts, known, emptyReports) {
  return missing ?? (always ? 'missing' :
    known ? (known.rows ? 'missing' : empty?.(facts) ?? 'noRows') :
    {none: 'missing', all: 'noRows', some: 'unclear'}[emptyReports]);
}

// What the section says besides its rows: of failure, damage, a cut, and of nothing to show.
// `facts`: those of the run, and `known`: those about the report, if any.
function notesOf(report, data, facts, known, emptyReports) {
  const notes = known?.ok === false ? [note('failed')] : [];
  if (!data) {
    return notes.length ? notes : [note(absence(report, facts, known, emptyReports))];
  }
  const rows = rowsOf(data).length;
  const count = format.number(rows);
  if (!data.whole) {
    notes.push(note(rows ? 'recovered' : 'damaged', {n: count}));
  } else if (data.oddKeys.length) {
    notes.push(note('readFromText', {
      n: count, name: data.oddKeys.map(shownPlain).join(', ')}));
  } else if (rows === 0) {
    notes.push(note('noRows'));
  }
  if (known && known.shown < known.rows) {
    notes.push(note(report.cut ?? 'firstRows', {n: format.number(known.limit ?? known.shown)}));
  }
  return notes;
}

// A print shows what is folded.
window.addEventListener('beforeprint', () => document.querySelectorAll('details:not([open])').forEach(
  details => {
    details.open = true;
    window.addEventListener('afterprint', () => { details.open = false; }, {once: true});
  }));

// Fills `section` with report `name`. `data` is undefined without a block, `facts` without those;
// `emptyReports` says which of the reports without a block have just found nothing: all, some or
// none. `mark`: level of an incident that concerns the report, if any.
export function fillSection(section, name, {data, facts, emptyReports, mark}) {
  const report = REPORTS[name];
  const known = facts?.reports.get(name);
  const heading = format.nameOf('reports', data?.heading ?? name);
  const csv = report?.hasCsv && !(known && known.csv === undefined) ? `csv/${name}.csv` : undefined;
  section.replaceChildren(
    h('h2', {id: `${name}-heading`}, name === 'volume_usage' ? format.say('history') : heading,
      mark && levelElement(mark, false)),
    ...report ? notesOf(report, data, facts, known, emptyReports) : [note('unknown')],
    ...data && rowsOf(data).length ? report.show({...data, heading, csv}, facts).filter(Boolean) :
      []);
  for (const title of section.querySelectorAll('.title')) {
    title.textContent = title.textContent === heading ? '' : title.textContent;
  }
}
