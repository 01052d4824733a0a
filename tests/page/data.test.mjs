// Blocks that are missing, cut or broken: each harms its own section only, and what can be read is
// shown.
import assert from 'node:assert/strict';
import test from 'node:test';

import {ALL, assertSensible, choose, fileOf, read, section, sections, withBlock, withPage} from './browser.mjs';

const END = '</script>\n';
const damaged = n => [n ? `The data of this report is damaged. Rows that could be read: ${
  n}. The log of the run says why.` : 'The data of this report is damaged. The log of the run says why.'];
const missing = ['The data of this report is missing. The log of the run says why.'];
const nothing = ['Nothing was found.'];
const fromText = (n, names) => [`The account name ${
  names} is unusual in this report's data, so the rows were read from its text: ${n}.`];

const FILE = "[ 's', '/f', '1' ]", TYPE = "[ 'reportUI_file_type_text', 's', 1 ]";
const share = (name, size = '1') => `[ '${name}', '/', '${size}' ]`;
const block = (...rows) => `[\n${rows.join(',\n')}\n];\n${END}`;
const types = (...keys) => `{\n${keys.map(key => `${key} : [\n${TYPE}\n]\n`).join(',\n')}\n}${END}`;

// Report, variable, its block, notes, and how the rows begin.
const CASES = {
  'cut in a row': ['share_list', 'vornShareListData', `[\n${share('a')},\n[ 'b', '/`, damaged(1), [['a']]],
  'cut behind a row': ['share_list', 'vornShareListData', `[\n${share('a')}`, damaged(1), [['a']]],
  'cut at once': ['share_list', 'vornShareListData', '[\n', damaged(0), []],
  'syntax error': ['share_list', 'vornShareListData', block(share('a'), "[ 'b', it's, '1' ]", share('c')),
                   damaged(2), [['a'], ['c']]],
  'column lost': ['share_list', 'vornShareListData', block("[ 'a', '/' ]", share('b')), damaged(1), [['b']]],
  'missing': ['share_list', 'vornShareListData', '', missing, []],
  'empty': ['large_file', 'vornLargeFileData', END, nothing, []],
  'odd sizes': ['share_list', 'vornShareListData', block(...['1', '-1', 'nan', '', '1e3'].map(size => share(size, size))),
                [], [['1', '1 B'], ['-1', '–'], ['nan', '–'], ['', '–'], ['1e3', '–']]],
  'full': ['large_file', 'vornLargeFileData', block(...Array(200).fill(FILE)),
           ['These are the first 200 rows. The CSV file holds more.'], [['/f', '1 B', 's']]],
  'one less': ['large_file', 'vornLargeFileData', block(...Array(199).fill(FILE)), [], [['/f']]],
  'keys': ['file_group', 'vornFileGroupTableData',
           types('vornAll', 'john-doe', 'DOM\\user', '__proto__', '007', '1e3'),
           fromText(6, 'john-doe, DOM\\user, __proto__, 007, 1e3'), [['Texts', 's', '1 B']],
           ['All files', 'john-doe', 'DOM\\user', '__proto__', '007', '1e3']],
  'stray ends': ['file_group', 'vornFileGroupTableData', `{\nvornAll : [\n${TYPE}]\n\n]\n\n]\n\n}${END}`,
                 [], [['Texts']], ['All files']],
  'types cut': ['file_group', 'vornFileGroupTableData', `{\nvornAll : [\n${TYPE}${END}`, damaged(1), [['Texts']]],
  'half a type': ['file_group', 'vornFileGroupTableData', `{\nvornAll : [\n[ 'a', 's ]\n}${END}`, damaged(0), []],
  'type unheard': ['file_group', 'vornFileGroupTableData',
                   `{\nvornAll : [\n[ 'reportUI_file_type_odd', 's', 1 ]\n]\n}${END}`, [], [['odd', 's', '1 B']]],
  'no types': ['file_group', 'vornFileGroupTableData', `\n}${END}`, nothing, []],
  'quotas': ['quota_usage', 'vornQuotaUsageTable',
             `{\n'/' : [\n['a', 0, 2048, -1.0],\n['b', 1024, 1536, 150.0]] , \n'/mnt/__proto__' : [\n] }\n${END}`,
             [], [['b', '150%', '1.5 KiB', '1 KiB'], ['a', '–', '2 KiB', 'no limit']], ['/']],
  'hundred users': ['quota_usage', 'vornQuotaUsageTable',
                    `{\n'/' : [\n${Array(100).fill("['a', 0, 0, -1.0]").join(',\n')}]}\n${END}`,
                    ['These are the 100 users with the smallest usage. More are not shown.'], [['a', '–', '0 B', 'no limit']]],
  'bare nan': ['volume_usage', 'vornVolumeUsageData', block("[ '/', nan , 1, 'nan%', '12' ]"), [],
               [['/', '–', 'Size unknown', '–', '1 B']]],
  'no quotas': ['quota_usage', 'vornQuotaUsageTable', '', [
    'No quotas could be read: no volume has user quotas, or /sbin/repquota is missing. The log of the run says which.'], []],
  'owners': ['file_owner', 'vornFileOwnerData', block("[ 'a', 's', 'x', '-1' ]"), [], [['a', '–', '0']]],
  'times': ['most_modify', 'vornMostModifyData', block(...['0', '-5', '9'.repeat(20), '', 'x'].map(
    time => `[ 's', '/f', '1', '${time}' ]`)), [], Array(5).fill(['/f', '1 B', '–'])],
  'group': ['duplicate_file', 'vornDuplicateFileData', block("[ 'x', 's', '/f', '-1', '0' ]"), [],
            [['–', 'f', '1', '–', '0 B']]]
};

test('blocks harm only their own section', async t => {
  const whole = read('hostile');
  let untouched;
  await withPage(whole, async page => {
    untouched = await sections(page);
  });
  for (const [name, [report, variable, text, notes, rows, captions]] of Object.entries(CASES)) {
    await t.test(name, () => withPage(withBlock(whole, variable, text), async page => {
      const all = await sections(page), shown = all[report];
      const history = report === 'volume_usage' ? shown.notes.slice(-1) : [];
      assert.deepEqual(shown.notes, [...notes, ...history]);
      assert.deepEqual(shown.rows.slice(0, rows.length).map(
        (row, i) => row.slice(0, rows[i].length)), rows);
      assert.equal(shown.rows.length > 0, rows.length > 0);
      assert.deepEqual(captions ?? shown.captions, shown.captions);
      assert.deepEqual({...all, [report]: untouched[report]}, untouched);
      await assertSensible(page);
    }));
  }
});

// Days that the program estimated, percentages of the samples, from the newest on, and the words.
const NOW = 1700000000;
const OUTLOOKS = [
  ['12', [91, 80], 'Full in 12 days'], ['1', [91, 80], 'Full in 1 day'], ['3650', [91, 80], 'Full in 10 years'],
  ['0', [91, 20], 'Full within a day'], ['0', [91, 91], 'No growth'], ['0', [91, 95], 'No growth'],
  ['-3', [91, 80], 'No growth'], ['999999999999', [91, 80], 'No growth'], ['x', [91, 80], 'No growth'],
  ['-', [91, 80], 'Not enough history'], ['12', [91], 'Full in 12 days'], ['12', null, 'Full in 12 days'],
  ['0', [91], 'Not enough history'], ['0', null, 'Not enough history'], ['0', ['nan', -1, 91], 'Not enough history'], ['12', [91, 80], 'Full', 0], ['12', [91, 80], 'Size unknown', -1]];

test('the forecast says the same everywhere', async () => {
  const names = OUTLOOKS.map((_, i) => `/v${i}`);
  const usage = OUTLOOKS.map(([days, , , free = 9], i) =>
    `[ '/v${i}', ${free < 0 ? 0 : 91} , ${Math.max(free, 0)}, '-nan%', '${days}' ]`);
  const samples = OUTLOOKS.flatMap(([, percents], i) => percents ? [`'/v${i}' : [\n${percents.map((percent, k) =>
    `[ '${percent === -1 ? 0 : NOW - k * (k > 2 ? 9e6 : 86400)}', '${percent}' ]`).join(',\n')}\n]`] : []);
  const page = withBlock(withBlock(read('hostile'), 'vornVolumeUsageData', block(...usage)),
                         'vornVolumeUsageDataHistory', `{\n${samples.join(',\n')}\n}\n${END}`);
  await withPage(page, async view => {
    const {rows} = await section(view, 'volume_usage');
    const table = new Map(rows.filter(row => row.length === 5).map(row => [row[0], row[2]]));
    const cards = new Map(await view.$$eval('.card', all => all.map(one => [
      one.querySelector('h3').textContent, one.querySelector('.outlook').lastChild.textContent.trim()])));
    const lines = await view.$$eval('.history .line', all => all.map(one => [
      one.querySelector('title')?.textContent, one.querySelector('.forecast') !== null]));
    OUTLOOKS.forEach(([, percents, words], i) => {
      assert.deepEqual([cards.get(names[i]), table.get(names[i])], [words, words], names[i]);
      assert.equal(new Map(lines).get(names[i]) ?? false, percents !== null && /^Full (in|within)/.test(words), names[i]);
    });
    for (const line of await view.$$eval('.notices a[href="#volume_usage"]', all => all.map(one => one.textContent))) {
      assert.ok(line.endsWith(`${table.get(/^\S+/.exec(line)[0])}.`), line);
    }
    await assertSensible(view);
  });
});

test('reports that failed say so, and empty ones that nothing was found', async t => {
  const short = ['There is only the sample of this report yet. Each report and each run with --data global adds one.'];
  const [quotas] = CASES['no quotas'][3];
  for (const [name, expected] of [
    ['broken', {volume_usage: short, quota_usage: [quotas], duplicate_file: nothing, least_modify: nothing}],
    ['empty', {...Object.fromEntries(ALL.map(report => [report, nothing])), quota_usage: [quotas],
               volume_usage: short}]]) {
    await t.test(name, () => withPage(fileOf(name), async page => {
      await choose(page, 'en');
      for (const [report, {notes, rows}] of Object.entries(await sections(page))) {
        assert.deepEqual(notes, expected[report] ?? [], report);
        assert.equal(rows.length > 0, report === 'volume_usage' || !expected[report], report);
      }
      await assertSensible(page);
    }));
  }
});
