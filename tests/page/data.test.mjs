// Blocks that are missing, cut or broken: each harms its own section only, and what can be read is
// shown.
import assert from 'node:assert/strict';
import test from 'node:test';

import {ALL, assertSensible, choose, FORMAT, read, sections, withBlock, withBlocks, withPage} from './browser.mjs';
import {facts, volume, withFacts} from './facts.mjs';

const END = '</script>\n';
const damaged = n => [n ? `The data of this report is damaged. Rows that could be read: ${
  n}. The log of the run says why.` : 'The data of this report is damaged. The log of the run says why.'];
const missing = ['The data of this report is missing. The log of the run says why.'];
const nothing = ['Nothing was found.'];
const TYPE = "[ 'reportUI_file_type_text', 's', 1 ]";
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
  'keys': ['file_group', 'vornFileGroupTableData',
           types('vornAll', 'john-doe', 'DOM\\user', '__proto__', '007', '1e3'),
           [], [['Texts', '1 B', '100%'], ...Array(6).fill(['Texts', 's', '1 B'])],
           ['File types', 'All files', 'john-doe', 'DOM\\user', '__proto__', '007', '1e3']],
  'stray ends': ['file_group', 'vornFileGroupTableData', `{\nvornAll : [\n${TYPE}]\n\n]\n\n]\n\n}${END}`,
                 [], [['Texts']], ['File types', 'All files']],
  'types cut': ['file_group', 'vornFileGroupTableData', `{\nvornAll : [\n${TYPE}${END}`, damaged(1), [['Texts']]],
  'half a type': ['file_group', 'vornFileGroupTableData', `{\nvornAll : [\n[ 'a', 's ]\n}${END}`, damaged(0), []],
  'type unheard': ['file_group', 'vornFileGroupTableData',
                   `{\nvornAll : [\n[ 'reportUI_file_type_odd', 's', 1 ]\n]\n}${END}`, [], [['odd', '1 B'], ['odd', 's', '1 B']]],
  'no types': ['file_group', 'vornFileGroupTableData', `\n}${END}`, nothing, []],
  'quotas': ['quota_usage', 'vornQuotaUsageTable',
             `{\n'/' : [\n['a', 0, 2048, -1.0],\n['b', 1024, 1536, 150.0]] , \n'/mnt/__proto__' : [\n] }\n${END}`,
             [], [['b', '150%', '1.5 KiB', '1 KiB'], ['a', '–', '2 KiB', 'no limit']], ['/']],
  'bare nan': ['volume_usage', 'vornVolumeUsageData', block("[ '/', nan , 1, 'nan%', '12' ]"), [],
               [['/', '–', 'does not grow', '–', '1 B']]],
  'no quotas': ['quota_usage', 'vornQuotaUsageTable', '', [
    'No quotas could be read: no volume has user quotas, or /sbin/repquota is missing. The log of the run says which.'], []],
  'owners': ['file_owner', 'vornFileOwnerData', block("[ 'a', 's', 'x', '-1' ]"), [], [['a', '–', '–', '0']]],
  'times': ['most_modify', 'vornMostModifyData', block(...['0', '-5', '9'.repeat(20), '', 'x'].map(
    time => `[ 's', '/f', '1', '${time}' ]`)), [], Array(5).fill(['/f', '1 B', '–'])],
  'group': ['duplicate_file', 'vornDuplicateFileData', block("[ 'x', 's', '/f', '-1', '0' ]"), [],
            [['f', '1', '–', '0 B', '–']]]
};

// A page holds one case of each report.
test('blocks harm only their own section', async t => {
  const whole = withFacts(read('hostile'), facts({volumes: [volume('/', 1)]}));
  let untouched;
  await withPage(whole, async page => {
    untouched = await sections(page);
  });
  const turns = [];
  for (const [name, [report, ...rest]] of Object.entries(CASES)) {
    // What is said without a block depends on the others.
    const alone = !/^[[{]\n[['"]/.test(rest[1]);
    const turn = !alone && turns.find(each => !(report in each) && !each.alone);
    (turn || turns[turns.push(Object.defineProperty({}, 'alone', {value: alone})) - 1])[report] = [name, ...rest];
  }
  for (const [i, turn] of turns.entries()) {
    await t.test(`page ${i}`, () => withPage(withBlocks(
      whole, Object.values(turn).map(([, variable, block]) => [variable, block])), async page => {
      const all = await sections(page), expected = {...untouched};
      for (const [report, [name, , , notes, rows, captions]] of Object.entries(turn)) {
        const shown = all[report];
        assert.deepEqual(shown.notes, notes, name);
        assert.deepEqual(shown.rows.slice(0, rows.length).map(
          (row, at) => row.slice(0, rows[at].length)), rows, name);
        assert.equal(shown.rows.length > 0, rows.length > 0, name);
        assert.deepEqual(captions ?? shown.captions, shown.captions, name);
        expected[report] = shown;
      }
      assert.deepEqual(all, expected);
      await assertSensible(page);
    }));
  }
});

test('reports that failed say so, and empty ones that nothing was found', async t => {
  const short = ['There are only samples of a single day yet. Each report and each run with --data global adds one.'];
  const [quotas] = CASES['no quotas'][3];
  for (const [name, expected] of [
    ['broken', {quota_usage: [quotas], duplicate_file: nothing, least_modify: nothing, growth: nothing}],
    ['empty', {...Object.fromEntries(ALL.map(report => [report, nothing])), quota_usage: [quotas],
               volume_usage: [], folder_usage: undefined, coverage: undefined}]]) {
    const bare = withBlock(read(name), FORMAT.facts_variable, '');
    const first = {empty: ['There is no earlier report to compare with yet. What has grown is told from the next report on.'],
                 broken: ['This report failed. The log of the run says why.']}[name];
    for (const [page, usage, growth] of [[read(name), short, first], [bare, [], nothing]]) {
      await t.test(name, () => withPage(page, async view => {
        await choose(view, 'en');
        for (const [report, {notes, rows}] of Object.entries(await sections(view))) {
          assert.deepEqual(notes, {volume_usage: usage, growth}[report] ?? expected[report] ?? [], report);
          assert.equal(rows.length > 0, report === 'volume_usage' || !expected[report], report);
        }
        await assertSensible(view);
      }));
    }
  }
});
