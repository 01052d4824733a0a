// The reports of the page, in its order. To add one: name its variable and columns here, and its
// heading and new column names in every dictionary.
//
//   width     values in a row of its block
//   limit     rows (`limitOf`: numbers in that column) that the page gets at most, and the note
//   always    without a block the report has failed: it has no way to have no rows
//   mode      a variable whose value chooses the heading
//   show      the section's content from what was read, a list of elements
import {shareMap, typeBars} from './charts.js';
import {h, shownPlain} from './dom.js';
import * as format from './format.js';
import {table} from './table.js';
import {history} from './volumes.js';

const FILES = [['file', 'path'], ['size', 'size'], ['changed', 'time'], ['share', 'text']];

const rowsOf = ({tables}) => [...tables.values()].flat();
const csvOf = name => `csv/${name}.csv`;
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
export function groupsOf(rows) {
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
          {caption: data.heading, csv: csvOf('duplicate_file')})];
}

export const REPORTS = {
  volume_usage: {
    variable: 'vornVolumeUsageData',
    width: 5,
    always: true,
    show: ({volumes, hasHistory}) => [
      ...history(volumes, hasHistory),
      table([['volume', 'name'], ['percent', 'percent'], ['days', 'outlook'], ['used', 'size'],
             ['free', 'size']],
            volumes.map(({name, percent, outlook, used, free}) => [
              name, String(percent), {text: outlook.text, order: outlook.order},
              String(used ?? ''), String(free ?? '')]),
            {caption: format.nameOf('reports', 'volume_usage'), csv: csvOf('volume_usage'),
             sorted: 1})]
  },
  share_list: {
    variable: 'vornShareListData',
    width: 3,
    show: data => [
      shareMap(rowsOf(data)),
      table([['share', 'name'], ['size', 'size'], ['volume', 'text']], pick(rowsOf(data), 0, 2, 1),
            {caption: data.heading, csv: csvOf('share_list'), sorted: 1})]
  },
  file_group: {
    variable: 'vornFileGroupTableData',
    width: 3,
    limit: [100, 'cutRows'],
    show: ({tables}) => [typeBars(tables), ...[...tables].filter(([, rows]) => rows.length).map(
      ([name, rows]) => folded(name === 'vornAll' ? format.say('allFiles') : shownPlain(name), table(
        [['type', 'type'], ['share', 'text'], ['size', 'size']], bySize(rows, 2),
        {caption: name === 'vornAll' ? format.say('allFiles') : shownPlain(name), sorted: 2})))]
  },
  file_owner: {
    variable: 'vornFileOwnerData',
    width: 4,
    show: data => [
      table([['owner', 'name'], ['size', 'size'], ['files', 'count']],
            pick(totalsOf(rowsOf(data)), 0, 2, 1),
            {caption: data.heading, csv: csvOf('file_owner'), sorted: 1}),
      folded(format.say('byShare'), table(
        [['owner', 'name'], ['share', 'text'], ['size', 'size'], ['files', 'count']],
        pick(rowsOf(data), 0, 1, 3, 2), {caption: format.say('byShare')}))]
  },
  quota_usage: {
    variable: 'vornQuotaUsageTable',
    width: 4,
    limit: [100, 'smallestUsers'],
    eachTable: true,
    always: true,
    missing: 'noQuotas',
    show: ({tables}) => [...tables].filter(([, rows]) => rows.length).map(([name, rows]) => table(
      [['user', 'name'], ['percent', 'percent'], ['used', 'size'], ['quota', 'quota']],
      pick(bySize(rows, 3), 0, 3, 2, 1), {caption: shownPlain(name), sorted: 1}))
  },
  duplicate_file: {
    variable: 'vornDuplicateFileData',
    width: 5,
    limit: [200, 'firstGroups'],
    limitOf: 0,
    mode: 'vornDuplicateHashMatch',
    show: showDuplicates
  },
  large_file: {
    variable: 'vornLargeFileData',
    width: 3,
    limit: [200, 'firstRows'],
    show: data => [table(
      [['file', 'path'], ['size', 'size'], ['share', 'text']], pick(rowsOf(data), 1, 2, 0),
      {caption: data.heading, csv: csvOf('large_file'), sorted: 1})]
  },
  least_modify: {
    variable: 'vornLeastModifyData',
    width: 4,
    limit: [200, 'firstRows'],
    show: data => [table(FILES, pick(rowsOf(data), 1, 2, 3, 0),
                         {caption: data.heading, csv: csvOf('least_modify')})]
  },
  most_modify: {
    variable: 'vornMostModifyData',
    width: 4,
    limit: [200, 'firstRows'],
    show: data => [table(FILES, pick(rowsOf(data), 1, 2, 3, 0),
                         {caption: data.heading, csv: csvOf('most_modify')})]
  }
};

// Whether the page got as many rows as it gets at most.
export function isCut({limit, limitOf, eachTable}, {tables}) {
  if (!limit) {
    return false;
  }
  const all = [...tables.values()];
  if (limitOf !== undefined) {
    return Number(all.flat().at(-1)?.[limitOf]) >= limit[0];
  }
  const counts = all.map(rows => rows.length);
  return (eachTable ? Math.max(0, ...counts) : counts.reduce((sum, n) => sum + n, 0)) >= limit[0];
}

const note = (key, values) => h('p', {class: 'note'}, format.say(key, values));

// What the section says besides its rows: of damage, of a cut, and of nothing to show.
function notesOf(report, data, emptyReports) {
  if (!data) {
    return [note(report.missing ?? (report.always || emptyReports === 'none' ? 'missing' :
      emptyReports === 'all' ? 'noRows' : 'unclear'))];
  }
  const rows = [...data.tables.values()].flat().length;
  const count = format.number(rows);
  const notes = [];
  if (!data.whole) {
    notes.push(note(rows ? 'recovered' : 'damaged', {n: count}));
  } else if (data.oddKeys.length) {
    notes.push(note('readFromText', {
      n: count, name: data.oddKeys.map(shownPlain).join(', ')}));
  } else if (rows === 0) {
    notes.push(note('noRows'));
  }
  if (isCut(report, data)) {
    notes.push(note(report.limit[1], {n: format.number(report.limit[0])}));
  }
  return notes;
}

// A print shows what is folded.
window.addEventListener('beforeprint', () => document.querySelectorAll('details:not([open])').forEach(
  details => {
    details.open = true;
    window.addEventListener('afterprint', () => { details.open = false; }, {once: true});
  }));

// Fills `section` with report `name`. `data` is undefined without a block; `emptyReports` says
// which of the reports without a block have just found nothing: all, some or none.
export function fillSection(section, name, data, emptyReports) {
  const report = REPORTS[name];
  const rows = data ? [...data.tables.values()].flat() : [];
  const heading = format.nameOf('reports', data?.heading ?? name);
  section.replaceChildren(
    h('h2', {id: `${name}-heading`}, name === 'volume_usage' ? format.say('history') : heading),
    ...report ? notesOf(report, data, emptyReports) : [note('unknown')],
    ...rows.length ? report.show({...data, heading}).filter(Boolean) : []);
  for (const title of section.querySelectorAll('.title')) {
    title.textContent = title.textContent === heading ? '' : title.textContent;
  }
}
