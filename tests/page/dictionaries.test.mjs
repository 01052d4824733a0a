// The dictionaries have the same texts, each with a use, and one for everything that is said by a
// code.
import assert from 'node:assert/strict';
import {execFileSync} from 'node:child_process';
import fs from 'node:fs';
import path from 'node:path';
import test from 'node:test';

import {ALL, dictionary, fileOf, FORMAT, LANGUAGES, read, SOURCE} from './browser.mjs';

const ROOT = path.join(SOURCE, '..');
const en = dictionary('en');
const placeholders = text => (text.match(/\{\w+\}/g) ?? []).map(each => each.slice(1, -1)).sort();

test('all dictionaries have the same texts and placeholders', () => {
  const shape = (value, key = '') => typeof value === 'object' ?
    Object.entries(value).flatMap(([name, each]) => shape(each, `${key}.${name}`)).sort() :
    [`${key} ${placeholders(value)}`];
  assert.deepEqual(fs.readdirSync(path.join(SOURCE, 'template/lang')), LANGUAGES.map(code => `${code}.json`));
  for (const code of LANGUAGES) {
    assert.deepEqual(shape(dictionary(code)), shape(en), code);
    assert.doesNotMatch(JSON.stringify(dictionary(code)), /""/, code);
  }
});

test('every code and every report has its text', () => {
  const known = (group, names) => assert.deepEqual(Object.keys(en[group]).sort(), names.toSorted(), group);
  known('attention', Object.keys(FORMAT.attention));
  known('incidents', FORMAT.incidents);
  known('reports', [...ALL, 'duplicate_file0', 'duplicate_file1']);
  known('nav', [...ALL, 'incidents']);
  for (const [code, {values, section}] of Object.entries(FORMAT.attention)) {
    const given = [...Object.keys(values), ...'days' in values ? ['outlook'] : []];
    assert.deepEqual(placeholders(en.attention[code]).filter(name => !given.includes(name)), [], code);
    assert.ok(ALL.includes(section), code);
  }
  for (const text of Object.values(en.incidents)) {
    assert.deepEqual(placeholders(text), ['what']);
  }
});

// All text of the files below `folders`, without the names of classes, which aren't said.
const sources = (folders, ends) => folders.flatMap(folder => fs.readdirSync(path.join(ROOT, folder), {recursive: true}).filter(
  name => ends.test(name)).map(name => fs.readFileSync(path.join(ROOT, folder, name), 'utf8'))).join('\n').replace(
  /class: (['`]).*?\1/g, '');
const script = sources(['reportUI/page/src'], /\.js$/), program = sources(['src', 'platform', 'ctl', 'report_format'], /\.[ch]pp$|\.h$/);

test('every text is used', () => {
  const uses = {
    page: key => script.includes(`'${key}'`), columns: key => script.includes(`['${key}', '`),
    facts: key => script.includes(`'${key}'`), mail: key => program.includes(`"${key}"`),
    types: key => new RegExp(`(reportUI_file_type_|")${key}"`).test(program)};
  const others = ['attention', 'incidents', 'reports', 'nav'];  // exactly those of the format, above
  for (const [group, texts] of Object.entries(en)) {
    if (typeof texts === 'object' && !others.includes(group)) {
      assert.deepEqual(Object.keys(texts).filter(key => !uses[group](key)), [], group);
    }
  }
});

test('only a file that is named like a language is one', () => {
  const folder = fs.mkdtempSync('/var/tmp/vorn-languages-');
  try {
    fs.cpSync(SOURCE, folder, {recursive: true, filter: from => !from.includes('node_modules')});
    const names = ['de.json.bak', 'de.bak.json', 'fr~.json', '-x.json', 'abcdefgh.json', '.json', 'a b.json', 'de_AT.json', 'de-AT.json', 'x1.json'];
    for (const name of names) {
      fs.writeFileSync(path.join(folder, 'template/lang', name), '{}');
    }
    for (const name of ['report.js', 'report.css']) {
      fs.writeFileSync(path.join(folder, 'template', name), '');
    }
    const body = path.join(folder, 'body');
    for (const word of [[], ['share_list']]) {
      execFileSync(path.join(folder, 'build-template.sh'), ['body', body, ...word]);
    }
    execFileSync(path.join(folder, 'build-template.sh'), ['tail', body]);
    const codes = [...fs.readFileSync(body, 'utf8').matchAll(/data-language="(.*?)"/g)].map(([, code]) => code);
    assert.deepEqual(codes.sort(), [...LANGUAGES, 'de-AT', 'x1'].sort());
  } finally {
    fs.rmSync(folder, {recursive: true, force: true});
  }
  assert.equal(read('big').match(/data-language=/g).length, LANGUAGES.length, fileOf('big'));
});
