// The page stands alone, says so without JavaScript, and speaks the reader's language in the
// server's time zone.
import assert from 'node:assert/strict';
import fs from 'node:fs';
import path from 'node:path';
import test from 'node:test';

import {ALL, assertSensible, choose, dictionary, fileOf, FORMAT, isReady, LANGUAGES, read, sections, serve, textOf, withBlock, withPage} from './browser.mjs';
import {facts, withFacts} from './facts.mjs';

const PAGES = ['big', 'empty', 'hostile', 'broken', 'damaged'];
const big = read('server');

test('nothing is asked for or said, wherever the page lies', async t => {
  for (const name of PAGES) {
    await t.test(name, () => withPage(fileOf(name), async page => {
      // Every report of the program has a section that can show it.
      const shown = await sections(page);
      assert.deepEqual(Object.keys(shown).sort(), ALL.toSorted());
      assert.doesNotMatch(JSON.stringify(shown), /cannot show the report/);
    }));
  }
  await serve(big, address => withPage('', page => page.locator('.card').first().waitFor(), {address}));
  const [, style] = /<style>([^]*?)<\/style>/.exec(big), [script] = big.match(/<script>[^]*?<\/script>/g).slice(-1);
  assert.ok(Buffer.byteLength(style + script) <= 150 * 1000, 'script and style');
});

test('the policy lets no other script or style work', async () => {
  const evil = '<script>document.title="run"</script><img src=x onerror=\'document.title="run"\'>';
  await withPage(big.replace('<main', `<p style="color:#010203">${evil}</p><main`), async (page, said) => {
    assert.notEqual(await page.title(), 'run');
    assert.notEqual(await page.$eval('p[style]', each => getComputedStyle(each).color), 'rgb(1, 2, 3)');
    assert.equal(said.filter(line => /Content Security Policy/.test(line)).length, 4, said.join('\n'));
  }, {silent: false});
});

test('without JavaScript the page says so and links the CSV files', async () => {
  await withPage(fileOf('big'), async page => {
    assert.match(await page.locator('noscript').innerText(), /needs JavaScript/);
    const links = await page.$$eval('a[href^="csv/"]', all => all.map(each => each.getAttribute('href')));
    assert.deepEqual(links, FORMAT.reports.filter(report => report.has_csv_rows).map(({name}) => `csv/${name}.csv`));
    links.forEach(link => assert.ok(fs.existsSync(fileOf('big', link)), link));
  }, {javaScriptEnabled: false});
});

test('the first screen says what is wrong, what fills up and because of whom', async () => {
  for (const name of ['big', 'server']) {
    await withPage(fileOf(name), async page => {
      for (const part of await page.locator('#incidents li, #attention li, .card.large').all()) {
        const {y, height} = await part.boundingBox();
        assert.ok(y + height <= 800, `${await part.innerText()} ends at ${y + height}`);
      }
      const lost = await page.$$eval('a[href^="#"]', all => all.filter(
        each => !document.getElementById(each.hash.slice(1).split('?')[0])).map(each => each.href));
      assert.deepEqual(lost, []);
    });
  }
  await withPage(big, async page => {
    assert.equal(await page.locator('.card').count(), 4);
    assert.equal(await page.locator('.card.large .causes li').count(), 10);
    await page.locator('.causes a', {hasText: 'Engineering/'}).click();
    await page.waitForFunction(() => document.querySelectorAll('.trail button:not(.copy)').length === 3);
    // A line leads to its section, which the navigation then marks.
    await page.locator('#glance a').last().click();
    await page.waitForFunction(() => document.querySelector('nav [aria-current]')?.hash === '#least_modify');
    assert.ok(await page.$eval('#least_modify', each => each.getBoundingClientRect().top) < 200);
  });
});

test('a huge server makes a light page', () => withPage(fileOf('huge'), async page => {
  assert.equal(await page.locator('.card').count(), 12);
  assert.ok(await page.evaluate(() => document.querySelectorAll('*').length) <= 8000);
}));

test('each language, chosen without loading again', async () => {
  const [, largest] = /"types": \[.*?"type": "reportUI_file_type_(\w+)"/.exec(big);
  await withPage(big, async page => {
    for (const code of LANGUAGES) {
      const {page: texts, types, reports, columns} = dictionary(code);
      await choose(page, code);
      assert.equal(await page.evaluate(() => document.documentElement.lang), code);
      assert.equal(await page.evaluate(() => document.activeElement.value), code, 'the focus stays');
      assert.ok(await page.$eval('nav', nav => nav.scrollWidth <= nav.clientWidth), `the navigation fits in ${code}`);
      assert.ok((await page.title()).startsWith(texts.title));
      assert.deepEqual(await textOf(page, '#large_file h2, #attention h2, #large_file th.number button'),
                       [texts.attention, reports.large_file, columns.size]);
      assert.equal(await page.locator('#file_group th.type').first().innerText(), types[largest]);
    }
    await assertSensible(page);
    await choose(page, 'fr');
    await page.reload();
    await isReady(page);
    assert.equal(await page.evaluate(() => document.documentElement.lang), 'fr', 'it is remembered');
  });
  // What the profile says, what became of a dictionary, and what is chosen.
  const swap = (from, to) => text => text.replace(from, to);
  for (const [name, change, chosen, title] of [
    ['empty', text => text, 'de', 'Speicherbericht'],  // of the profile's de-AT
    ['hostile', text => text, 'en', 'Storage report'],  // of xx
    ['empty', swap('data-language="de">{', 'data-language="de">{,'), 'en', 'Storage report'],
    ['empty', swap(`"title": "${dictionary('de').page.title}",`, ''), 'de', 'Storage report'],
    ['empty', swap(/\nvar vornLang = .*\n/, '\n'), 'en', 'Storage report']]) {
    await withPage(change(read(name)), async (page, said) => {
      assert.equal(await page.evaluate(() => document.documentElement.lang), chosen);
      assert.ok((await page.locator('h1').innerText()).startsWith(title), title);
      assert.deepEqual(said.filter(line => !line.startsWith('dictionary de: ')), []);
    }, {silent: false});
  }
});

test('times are those of the server, whatever the zone of the reader', async () => {
  const moment = 1700000000;  // 22:13 on 14 November 2023 in UTC
  for (const [zone, time, named] of [
    ['Etc/UTC', 'Nov 14, 2023, 10:13 PM', 'Coordinated Universal Time, Etc/UTC'],
    ['Asia/Tokyo', 'Nov 15, 2023, 7:13 AM', 'Japan Standard Time, Asia/Tokyo'],
    ['America/New_York', 'Nov 14, 2023, 5:13 PM', 'Eastern Standard Time, America/New York'],
    ['+05:30', 'Nov 15, 2023, 3:43 AM', 'GMT+05:30, +05:30'],
    ['no/zone', 'Nov 14, 2023, 10:13 PM', 'Coordinated Universal Time, UTC']]) {
    const files = read('hostile').replace(/(var vornMostModifyData = \[\n.*')\d+(' \],?\n)/, `$1${moment}$2`);
    // The frame's word counts where there are no facts.
    const frame = withBlock(files, FORMAT.facts_variable, '').replace(
      /data-host=".*?" data-profile=".*?" data-time="\d+" data-zone=".*?"/,
      `data-host="frame" data-profile="p" data-time="${moment}" data-zone="${zone}"`);
    for (const [page, head] of [[withFacts(files, facts({finished: moment, time_zone: zone})), 'files.example|weekly'],
                                [frame, 'frame|p']]) {
      await withPage(page, async view => {
        const plain = async selector => (await view.locator(selector).first().innerText()).replaceAll('\u202f', ' ');
        assert.deepEqual([await plain('header time'), await plain('#most_modify td.changed'), await plain('.zone'),
                          `${await plain('.host')}|${await plain('header p b')}`], [time, time, named, head]);
        assert.equal(await view.title(), `Storage report – ${head.split('|')[0]}`);
      }, {timezoneId: 'Pacific/Auckland'});
    }
  }
});
