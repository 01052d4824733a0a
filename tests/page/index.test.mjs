// The list of a profile's reports: it stands alone, fits everywhere, and trusts no name.
import assert from 'node:assert/strict';
import test from 'node:test';

import {assertAccessible, assertSensible, choose, dictionary, fileOf, LANGUAGES, read, textOf, withPage} from './browser.mjs';

const EVIL = '<img src=x onerror="document.title=1">';
const big = read('big', 'index.html');
const [, json] = /id="data">(.*)<\/script>\n/.exec(big);
const withData = change => {
  const data = JSON.parse(json);
  change(data);
  return big.replace(json, () => JSON.stringify(data).replaceAll('<', '\\u003c'));
};

test('it lists the reports and draws the volumes', async () => {
  for (const options of [{}, {viewport: {width: 390, height: 844}}]) {
    await withPage(fileOf('big', 'index.html'), async page => {
      const links = await page.$$eval('#reports tbody a', all => all.map(each => each.getAttribute('href')));
      assert.deepEqual(links, JSON.parse(json).reports.map(({name}) => `${name}/report.html`).reverse());
      assert.equal(links.length, 2);
      assert.deepEqual(await page.$$eval('.chart b', all => all.map(each => each.textContent)),
                       JSON.parse(json).volumes.map(({path}) => path));
      await assertSensible(page);
      assert.ok(await page.evaluate(() => document.documentElement.scrollWidth <= innerWidth));
      await assertAccessible(page);
    }, options);
  }
  await withPage(big, async page => {
    for (const code of LANGUAGES) {
      await choose(page, code);
      assert.deepEqual(await textOf(page, '#reports h2'), [dictionary(code).page.allReports]);
    }
  });
});

test('hostile names are text, and reports without figures have none', async () => {
  const page = withData(data => {
    data.host = data.volumes[0].path = EVIL;
    data.reports.unshift({name: '2020-01-01_00-00-00', made: 2 ** 62});
    data.reports[1].used = 'x';
  });
  await withPage(page, async tab => {
    assert.equal(await tab.locator('.chart b').first().textContent(), EVIL);
    assert.equal(await tab.locator('main img, header img').count(), 0);
    assert.deepEqual(await textOf(tab, '#reports tbody tr:last-child td'), ['2020-01-01_00-00-00', '–', '–', '–']);
    await assertSensible(tab);
  });
  await withPage(withData(data => { data.reports = []; data.volumes = []; }), tab => assertSensible(tab));
});
