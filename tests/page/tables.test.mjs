// Tables and drawings under the hands of a reader.
import assert from 'node:assert/strict';
import test from 'node:test';

import {fileOf, FORMAT, read, section, textOf, withBlock, withPage} from './browser.mjs';
import {pageOf} from './facts.mjs';

const shares = withBlock(read('hostile'), 'vornShareListData', `[\n${[
  ['b', '/x', 1024], ['a10', '/', 5], ['Ä', '/', 'nan'], ['a9', '/', 1048576], ['c', '/x', 0], ['d', '/', 2000]].map(
  ([name, volume, size]) => `[ '${name}', '${volume}', '${size}' ]`).join(',\n')}\n];\n</script>\n`);

// What is unknown comes last either way.
test('sorting, by number and by text, both ways', () => withPage(shares, async page => {
  const shown = async () => (await section(page, 'share_list')).rows.map(row => row[0]).join(' ');
  const sorted = () => page.$$eval('#share_list thead th', all => all.map(each => each.getAttribute('aria-sort')));
  const [share, size, volume] = await page.locator('#share_list thead button').all();
  for (const [header, names, states] of [
    [size, 'c a10 b d a9 Ä', [null, 'ascending', null]], [size, 'a9 d b a10 c Ä', [null, 'descending', null]],
    [share, 'Ä a9 a10 b c d', ['ascending', null, null]], [share, 'd c b a10 a9 Ä', ['descending', null, null]],
    [volume, 'd a10 a9 Ä c b', [null, null, 'ascending']]]) {
    await header.press('Enter');
    assert.equal(await shown(), names);
    assert.deepEqual(await sorted(), states);
  }
}));

test('filtering, and all rows', () => withPage(pageOf('big'), async page => {
  const table = page.locator('#large_file .table');
  const visible = () => table.locator('tbody tr:visible').count();
  assert.equal(await visible(), 10);
  const count = table.locator('[role=status].count');
  assert.equal(await count.innerText(), '200 of 200');
  await table.locator('.more').click();
  assert.equal(await visible(), 200);
  await table.locator('input').fill('.ISO');
  const found = await visible();
  assert.ok(found > 0 && found < 50);
  assert.equal(await count.innerText(), `${found} of 200`);
  for (const name of await textOf(page, '#large_file tbody tr:visible .name')) {
    assert.match(name, /\.iso$/);
  }
  await table.locator('input').fill('no such');
  assert.deepEqual([await visible(), await count.innerText()], [0, '0 of 200']);
  assert.deepEqual((await section(page, 'large_file')).notes, ['These are the first 200 rows. The CSV file holds more.']);
  assert.deepEqual(await page.$$eval('a.csv', all => all.map(each => each.getAttribute('href')).sort()), FORMAT.reports
    .filter(report => report.has_csv_rows).map(({name}) => `csv/${name}.csv`).sort());
}));

test('growth has its sign, and is told where there is something to compare with', async () => {
  await withPage(fileOf('big'), async page => {
    const rows = (await textOf(page, '#growth tbody tr')).map(row => row.replace(/\s+/g, ' ').trim());
    assert.ok(rows.some(row => /^last report Share Photos \+3 GiB \+1$/.test(row)), rows.join('\n'));
    assert.ok(rows.some(row => /^last report Share Videos \u2212[\d.]+ \w+ \u22121$/.test(row)), rows.join('\n'));
    assert.ok(rows.some(row => /^last report File type Videos Video \u2212/.test(row)), rows.join('\n'));
    assert.match((await textOf(page, '#attention')).join(), /\/srv\/media grew by [\d.]+\sGiB since .*, mostly Photos\/to sort, mostly by anna/);
  });
  await withPage(fileOf('empty'), async page => assert.match((await section(page, 'growth')).notes[0], /keinen früheren Bericht/));
});

test('sizes tell their bytes to the keyboard', () => withPage(shares, async page => {
  const [share, , volume] = await page.locator('#share_list thead button').all();
  await share.click();  // for an order in which the stop is another row
  await volume.press('Tab');
  for (const bytes of ['1,048,576', '5', '1,024', '0', '2,000', '2,000']) {
    assert.equal(await page.evaluate(() => getComputedStyle(document.activeElement, '::after').content), `"${bytes} bytes"`);
    await page.keyboard.press('ArrowDown');
  }
  assert.equal(await page.locator('#share_list .bytes[tabindex="0"]').count(), 1);
}));

test('the treemap is one stop, in which arrows move', () => withPage(pageOf('big'), async page => {
  assert.equal(await page.locator('.treemap [tabindex="0"]').count(), 1);
  await page.locator('.treemap [tabindex="0"]').focus();
  const seen = new Set();
  for (const key of ['ArrowRight', 'ArrowDown', 'ArrowLeft', 'ArrowUp', 'ArrowRight', 'ArrowRight', 'ArrowRight', 'ArrowRight']) {
    await page.keyboard.press(key);
    const label = await page.evaluate(() => document.activeElement.getAttribute('aria-label'));
    assert.equal(await page.locator('.chosen').innerText(), label);
    seen.add(label);
  }
  assert.ok(seen.size > 4, [...seen].join('\n'));
  await page.keyboard.press('Tab');
  assert.equal(await page.evaluate(() => document.activeElement.closest('.treemap')), null);
}));

test('every drawing has its data as a table', () => withPage(pageOf('big'), async page => {
  for (const [name, drawing] of [['volume_usage', '.history'], ['share_list', '.treemap'], ['file_group', '.stack']]) {
    assert.ok(await page.locator(`#${name} ${drawing}`).count() > 0, name);
    await page.$$eval(`#${name} details`, all => all.forEach(each => { each.open = true; }));
    assert.ok(await page.locator(`#${name} table:visible tbody tr`).count() > 5, name);
  }
}));
