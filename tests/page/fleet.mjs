// The page of a report over several servers, VORN_FLEET in the folder VORN_PAGES, and the list of
// such reports. Of its servers one is called "left" and sends nothing any more.
import assert from 'node:assert/strict';
import fs from 'node:fs';
import path from 'node:path';
import test from 'node:test';

import {assertSensible, fileOf, read, section, textOf, withPage} from './browser.mjs';

const {VORN_FLEET: made, VORN_PAGES: folder} = process.env;
const facts = JSON.parse(read(made, 'report.json'));
const serverOf = name => name.split(':')[0];

test('everything tells whose it is', () => withPage(fileOf(made), async page => {
  await assertSensible(page);
  assert.match((await textOf(page, '#incidents li')).join('\n'), /left \(daily\)/);
  const cards = await page.$$eval('.card', all => all.map(card => [card.querySelector('h3').textContent,
    [...card.querySelectorAll('.causes a[href*=folder_usage]')].map(cause => cause.textContent)]));
  assert.deepEqual(cards.map(([title]) => title), facts.volumes.map(volume => volume.path));
  assert.equal(new Set(cards.map(([title]) => serverOf(title))).size, 3);
  assert.ok(cards[0][1].length);
  cards.forEach(([title, causes]) => causes.forEach(cause => assert.equal(serverOf(cause), serverOf(title))));
  // All servers have the same paths and shares.
  const copies = (await section(page, 'duplicate_file')).rows.map(row => Number(row[1])).filter(Number.isFinite);
  assert.ok(copies.length && copies.every(count => count > 1), copies.join());
  for (const name of ['large_file', 'least_modify', 'most_modify']) {
    const {rows} = await section(page, name);
    assert.ok(rows.length, name);
    rows.forEach(row => assert.equal(serverOf(row[0]), serverOf(row.at(-1)), row.join()));
  }
  // All links lead somewhere, and none to a folder of this machine's.
  for (const link of new Set(await page.$$eval('main a', all => all.map(each => each.getAttribute('href'))))) {
    assert.ok(link.startsWith('#') ? await page.locator(`[id="${/^#([^?]*)/.exec(link)[1]}"]`).count() === 1 :
      fs.existsSync(path.join(folder, made, decodeURIComponent(link))), link);
  }
}));

test('its reports are listed', () => withPage(fileOf('', 'index.html'), async page => {
  assert.match(await page.locator('header').innerText(), /Profile fleet/);
  assert.deepEqual((await page.$$eval('#reports tbody a', all => all.map(each => each.getAttribute('href')))).sort(),
                   fs.readdirSync(folder).filter(name => /^\d/.test(name)).map(name => `${name}/report.html`).sort());
  assert.equal(fs.readlinkSync(path.join(folder, 'latest')), made);
}));
