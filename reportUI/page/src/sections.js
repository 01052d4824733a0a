// The reports of the page, in its order. To add one: name it here, with its heading and new column
// names in every dictionary. Its variable, columns and limit are the program's.
//
//   always    without a block the report has failed: it has no way to have no rows
//   missing   what is said without a block, in place of that
//   empty     what is said of no rows, by the facts
//   cut       what is said when the page lacks rows of it
//   mode      a variable whose value chooses the heading
//   noted     the cut is said above the table, for that shows a part of the rows
//   partly    only a part of the section lacks what is cut, and says so itself
//   series    a variable with what was before, by the first column: `before` of what was read
//   show      the section's content, a list of elements, from what was read: {tables, heading, csv}
//             (`csv`: address of the file with its rows; `beyond`: rows that only that has; `cut`: a
//             note of rows that the page lacks) and the facts, and what it may ask of others, see
//             fillSection()
import {reports as FORMATS} from 'report_format';

import {ages} from './ages.js';
import {sparkline} from './charts.js';
import {h, shown, shownPlain} from './dom.js';
import {folders, shareMap} from './folders.js';
import * as format from './format.js';
import {growth} from './growth.js';
import {history} from './history.js';
import {outlookOrder, outlookText} from './outlook.js';
import {owners} from './owners.js';
import {copyButton, table, withParts} from './table.js';
import {types} from './types.js';
import {levelElement} from './volumes.js';

const FILES = [['file', 'path'], ['size', 'size', {bar: true, sum: true}], ['changed', 'time'],
               ['share', 'text', {low: true}]];

const rowsOf = ({tables}) => [...tables.values()].flat();
// Where a file of a share lies. In a report over many servers this begins with its server's name, as
// the share's does: a path may be on each of them.
const pathOf = (share, file, facts) => facts?.isFleet ? share.slice(0, share.indexOf(':') + 1) + file : file;
const filesOf = (data, facts) => rowsOf(data).map(
  ([share, file, ...others]) => [share, pathOf(share, file, facts), ...others]);
const pick = (rows, ...order) => rows.map(row => order.map(index => row[index]));

const bySize = (rows, index) => rows.toSorted(
  (one, two) => (parseFloat(two[index]) || 0) - (parseFloat(one[index]) || 0));

// The groups of duplicates: {number, size, files, frees}, `files` a Map of path to time. A file that
// two shares hold in common is one file.
function groupsOf(rows, facts) {
  const groups = new Map();
  for (const [number, share, file, size, time] of rows) {
    const group = groups.get(number) ?? {number, size, files: new Map()};
    group.files.set(pathOf(share, file, facts), time);
    groups.set(number, group);
  }
  return [...groups.values()].map(group => ({
    ...group,
    frees: format.isNumber(group.size) ? BigInt(group.size) * BigInt(group.files.size - 1) : 0n}));
}

const copiesOf = files => h('ul', {class: 'copies'}, ...[...files].map(([file, time]) => h(
  'li', {}, h('span', {class: 'path'}, h('span', {}, shown(file)), copyButton(file)),
  h('span', {class: 'soft'}, format.time(time)))));

// A row for each group, which opens to its files.
function duplicates({tables, heading, csv, beyond}, facts) {
  const groups = groupsOf([...tables.values()].flat(), facts).sort((one, two) => two.frees > one.frees ? 1 :
    two.frees < one.frees ? -1 : 0);
  const named = new Map(groups.map(group => [group.number, group]));
  const rows = groups.map(({number, files, size, frees}) => {
    const [file] = files.keys();
    return [file.slice(file.lastIndexOf('/') + 1), String(files.size), size, String(frees), number,
            [...files.keys()].join('\n')];
  });
  return [table([['file', 'name'], ['copies', 'count', {sum: true}], ['size', 'size', {low: true}],
                 ['frees', 'size', {bar: true, sum: true}], ['group', 'count', {low: true}]],
                rows, {key: 'duplicate_file', caption: heading, csv, beyond, sorted: 3,
                       detail: {name: ([, , , , number]) => number,
                                make: ([, , , , number]) => copiesOf(named.get(number).files)}})];
}

// The shares with their course and growth.
function shares(data, facts, {heading, csv}) {
  const known = new Map(facts?.shares?.map(share => [share.name, share]));
  const grows = [...known.values()].some(({grown}) => grown?.month);
  const drawn = [...known.values()].some(({samples}) => samples.length > 1);
  const trend = share => ({
    order: share?.samples.length > 1 ? share.samples.at(-1).used - share.samples[0].used : NaN,
    make: () => share ? sparkline(share.samples, {width: 90, height: 22, now: facts.finished}) : null});
  const rows = rowsOf(data).map(([name, id, bytes]) => [
    name, bytes, ...grows ? [String(known.get(name)?.grown?.month?.bytes ?? '')] : [],
    ...drawn ? [trend(known.get(name))] : [], ...known.size ? [String(known.get(name)?.files ?? '')] : [],
    format.volumeName(id)]);
  return table(...withParts([['share', 'name'], ['size', 'size', {bar: true, sum: true}],
                             ...grows ? [['inMonth', 'change', {sum: true}]] : [],
                             ...drawn ? [['trend', 'element', {low: true}]] : [],
                             ...known.size ? [['files', 'count', {sum: true, low: true}]] : [],
                             ['volume', 'text', {low: true}]], rows, 1),
               {key: 'share_list', caption: heading, csv, sorted: 1});
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
  const columns = [['volume', 'name'], ['percent', 'percent'], ['used', 'size', {sum: true, low: true}],
                   ['free', 'size', {sum: true, low: true}]];
  return table(facts ? [...columns.slice(0, 2), ['days', 'outlook'], ...columns.slice(2)] : columns,
               pick(bySize(rows, 1), ...facts ? [0, 1, 4, 2, 3] : [0, 1, 2, 3]),
               {caption: format.nameOf('reports', 'volume_usage'), csv: data.csv, sorted: 1,
                key: 'volume_usage'});
}

// What is used on each volume, and how much of it the shares hold.
function explainedTable(facts) {
  const ofIndex = new Set(facts.shares?.filter(({index}) => index).map(({volume}) => volume));
  const volumes = facts.volumes.filter(({explained}) => explained !== undefined);
  const rows = volumes.map(({path, used, explained, outside}) => [path, used, explained, outside].map(String));
  return rows.length ? [
    table([['volume', 'name'], ['used', 'size'], ['explained', 'size'], ['outside', 'outside']], rows,
          {key: 'coverage.volumes', caption: format.say('volumes')}),
    ...volumes.filter(({path}) => ofIndex.has(path)).map(
      ({path}) => h('p', {class: 'note'}, format.say('partlyByIndex', {name: shownPlain(path)})))] : [];
}

const filesTable = (key, columns, rows, {heading, csv, beyond}, sorted) => [
  table(columns, rows, {key, caption: heading, csv, beyond, sorted})];

export const REPORTS = {
  volume_usage: {
    always: true,
    series: 'vornVolumeUsageDataHistory',
    show: (data, facts) => {
      const drawn = facts ? history(facts.volumes, facts.finished, data.before) : [];
      return [...drawn.slice(0, 2), usageTable(data, facts), ...drawn.slice(2)];
    }
  },
  growth: {
    empty: facts => facts.volumes.some(volume => volume.grown_by) ? 'nothingGrew' :
      'nothingToCompare',
    show: (data, facts) => growth(rowsOf(data), facts, data)
  },
  folder_usage: {
    noted: true,
    show: (data, facts, {shareRows}) => folders(rowsOf(data), shareRows(), facts, data)
  },
  share_list: {
    show: (data, facts, {has}) => [
      has('folder_usage') ? null : shareMap(rowsOf(data), facts), shares(data, facts, data)]
  },
  file_owner: {
    show: (data, facts) => owners(rowsOf(data), facts, data)
  },
  file_group: {
    cut: 'cutRows',
    partly: true,
    show: (data, facts) => types(data.tables, facts, data)
  },
  file_age: {
    show: (data, facts, {has}) => ages(rowsOf(data), {...data, hasOldest: has('least_modify')})
  },
  quota_usage: {
    always: true,
    missing: 'noQuotas',
    cut: 'smallestUsers',
    show: ({tables}) => [...tables].filter(([, rows]) => rows.length).map(([id, rows]) => table(
      [['user', 'name'], ['percent', 'percent'], ['used', 'size', {sum: true}], ['quota', 'quota']],
      pick(bySize(rows, 3), 0, 3, 2, 1),
      {key: `quota_usage.${id}`, caption: shownPlain(format.volumeName(id)), sorted: 1}))
  },
  duplicate_file: {
    cut: 'firstGroups',
    mode: 'vornDuplicateHashMatch',
    show: duplicates
  },
  large_file: {
    show: (data, facts) => filesTable('large_file', [...FILES.slice(0, 2), FILES[3]], pick(filesOf(data, facts), 1, 2, 0),
                             data, 1)
  },
  least_modify: {
    // The large ones first: they are worth a look.
    show: (data, facts) => filesTable('least_modify', FILES, bySize(pick(filesOf(data, facts), 1, 2, 3, 0), 1), data, 1)
  },
  most_modify: {
    show: (data, facts) => filesTable('most_modify', FILES, pick(filesOf(data, facts), 1, 2, 3, 0), data)
  },
  coverage: {
    show: (data, facts) => [
      ...facts ? explainedTable(facts) : [],
      table([['volume', 'name', {low: true}], ['share', 'text'], ['size', 'size', {bar: true, sum: true}],
             ['allocated', 'size', {sum: true}], ['files', 'count', {sum: true, low: true}],
             ['unreadable', 'count', {low: true}], ['other', 'count', {low: true}]],
            rowsOf(data).map(([volume, share, files, bytes, allocated, unreadable, other]) => [
              format.volumeName(volume), share, bytes, allocated, files, unreadable, other]),
            {key: 'coverage', caption: data.heading, csv: data.csv})]
  }
};
for (const {name, variable, columns, has_csv_rows: hasCsv, limit_of: limitOf} of FORMATS) {
  Object.assign(REPORTS[name] ?? {}, {variable, columns, hasCsv, limitOf});
}

const note = (key, values) => h('p', {class: 'note'}, format.say(key, values));

// What is said of a report without a block.
function absence({always, missing, empty}, facts, known, emptyReports) {
  return missing ?? (always ? 'missing' :
    known ? (known.rows ? 'missing' : empty?.(facts) ?? 'noRows') :
    {none: 'missing', all: 'noRows', some: 'unclear'}[emptyReports]);
}

// What is said of rows that the page lacks; null where it has all, or the table itself says of so many,
// `beyond`, that the CSV file has them.
const cutNote = (report, data, known, beyond) =>
  known && known.shown < known.rows && !(beyond && rowsOf(data).length) ?
    note(report.cut ?? 'firstRows', {n: format.number(known.limit ?? known.shown)}) : null;

// What the section says besides its rows: of failure, damage, `cut`, and of nothing to show.
// `facts`: those of the run, and `known`: those about the report, if any.
function notesOf(report, data, {facts, known, emptyReports, cut}) {
  const notes = known?.ok === false ? [note('failed')] : [];
  if (!data) {
    return notes.length ? notes : [note(absence(report, facts, known, emptyReports))];
  }
  const rows = rowsOf(data).length;
  const count = format.number(rows);
  if (!data.whole) {
    notes.push(note(rows ? 'recovered' : 'damaged', {n: count}));
  } else if (rows === 0) {
    notes.push(note('noRows'));
  }
  return [...notes, report.partly ? null : cut];
}

// What a reader sees of a section: content of report `name`. `data` is undefined without a block,
// `facts` without those; `emptyReports` says which of the reports without a block have just found
// nothing: all, some or none. `mark`: level of an incident that concerns the report, if any.
// `others`: what the section may ask of other reports, {has(name), shareRows()}.
export function fillSection(section, name, {data, facts, emptyReports, mark, others}) {
  const report = REPORTS[name];
  const known = facts?.reports.get(name);
  const heading = format.nameOf('reports', data?.heading ?? name);
  const csv = report?.hasCsv && !(known && known.csv === undefined) ? `csv/${name}.csv` : undefined;
  const isTold = csv && known && report.limitOf === 'rows' && !report.noted;
  const beyond = isTold ? Math.max(0, known.rows - known.shown) : 0;
  const cut = data && report ? cutNote(report, data, known, beyond) : null;
  section.replaceChildren(...[
    h('h2', {id: `${name}-heading`}, name === 'volume_usage' ? format.say('history') : heading,
      mark ? levelElement(mark, false) : null),
    ...report ? notesOf(report, data, {facts, known, emptyReports, cut}) : [note('unknown')],
    ...data && rowsOf(data).length ? report.show({...data, heading, csv, beyond, cut}, facts, others) : []
  ].filter(Boolean));
  for (const title of section.querySelectorAll('.title')) {
    title.textContent = title.textContent === heading ? '' : title.textContent;
  }
}
