// The page of a real run says what its mail and vornctl say, to the last figure.
import assert from 'node:assert/strict';
import test from 'node:test';

import {fileOf, read, textOf, withPage} from './browser.mjs';

const facts = JSON.parse(read('big', 'report.json'));
const mail = read('big', 'mail.txt').replaceAll('\u00a0', ' ');
const [status] = JSON.parse(read('big', 'status.json'));
const plain = text => text.replaceAll('\u00a0', ' ').replace(/\s+/g, ' ').trim();

test('what needs attention is said alike by page, mail and vornctl', () => withPage(fileOf('big'), async page => {
  const said = (await textOf(page, '#attention li')).map(plain);
  const pressing = status.attention.filter(({level}) => level !== 'ok').map(({text}) => plain(text));
  assert.ok(pressing.length > 1, JSON.stringify(status.attention));
  for (const sentence of pressing) {
    assert.ok(said.some(line => line.includes(sentence)), `${sentence}\n${said.join('\n')}`);
    assert.ok(mail.includes(sentence), `${sentence}\n${mail}`);
  }
  assert.ok(mail.startsWith(pressing[0]), mail.split('\n')[0]);
}));

test('cards tell the volumes of the facts, the most pressing first', () => withPage(fileOf('big'), async page => {
  const cards = (await textOf(page, '.card h3')).map(plain);
  assert.deepEqual(cards, facts.volumes.map(({path}) => path));
  assert.equal(status.volume.path, facts.volumes[0].path);
  assert.deepEqual(status.volume, facts.volumes[0]);
  const first = plain((await textOf(page, '.card'))[0]);
  const outlook = /full in about \d+ days \(\d+ to \d+\)/.exec(mail)?.[0];
  assert.ok(outlook && first.toLowerCase().includes(outlook), `${outlook}: ${first}`);
}));
