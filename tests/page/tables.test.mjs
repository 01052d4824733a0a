// Tables and drawings under the hands of a reader.
import assert from 'node:assert/strict';
import test from 'node:test';

import {choose, fileOf, FORMAT, isReady, openAll, read, section, textOf, withBlock, withPage} from './browser.mjs';

const shares = withBlock(withBlock(read('hostile'), FORMAT.facts_variable, ''), 'vornShareListData', `[\n${[
  ['b', '/x', 1024], ['a10', '/', 5], ['Ä', '/', 'nan'], ['a9', '/', 1048576], ['c', '/x', 0], ['d', '/', 2000]].map(
  ([name, volume, size]) => `[ '${name}', '${volume}', '${size}' ]`).join(',\n')}\n];\n</script>\n`);

// What is unknown comes last either way.
test('sorting, by number and by text, both ways', () => withPage(shares, async page => {
  const shown = async () => (await section(page, 'share_list')).rows.map(row => row[0]).join(' ');
  const sorted = () => page.$$eval('#share_list thead th', all => all.map(each => each.getAttribute('aria-sort')));
  const [share, size, , volume] = await page.locator('#share_list thead button').all();
  for (const [header, names, states] of [
    [size, 'c a10 b d a9 Ä', [null, 'ascending', null, null]], [size, 'a9 d b a10 c Ä', [null, 'descending', null, null]],
    [share, 'Ä a9 a10 b c d', ['ascending', null, null, null]], [share, 'd c b a10 a9 Ä', ['descending', null, null, null]],
    [volume, 'd a10 a9 Ä c b', [null, null, null, 'ascending']]]) {
    await header.press('Enter');
    assert.equal(await shown(), names);
    assert.deepEqual(await sorted(), states);
  }
}));

test('filtering by words in any order, all rows, and the sum of what is there', () => withPage(read('server'), async page => {
  const table = page.locator('#large_file .table');
  const visible = () => table.locator('tbody tr:visible').count();
  const total = async () => (await table.locator('tfoot th').innerText()).trim();
  assert.deepEqual([await visible(), await total()], [10, 'Total of 200']);
  const count = table.locator('[role=status].count');
  assert.equal(await count.innerText(), '200 of 200 and 9,800 more in the CSV file');
  await table.locator('.more').click();
  await page.waitForFunction(() => document.querySelectorAll('#large_file tbody tr').length === 200);
  await table.locator('.more').scrollIntoViewIfNeeded();
  const {y} = await table.locator('.more').boundingBox();
  await table.locator('.more').click();
  assert.ok(Math.abs((await table.locator('.more').boundingBox()).y - y) < 2, 'fewer keeps the place');
  await table.locator('input').fill('.ISO engineering');
  const found = await visible();
  assert.ok(found > 0 && found < 50);
  assert.deepEqual([await total(), (await count.innerText()).split(' and')[0]], [`Total of ${found}`, `${found} of 200`]);
  for (const name of await textOf(page, '#large_file tbody tr:visible .name')) {
    assert.match(name, /\.iso$/);
  }
  await table.locator('input').fill('no such');
  assert.equal(await visible(), 0);
  await openAll(page);
  assert.deepEqual(await page.$$eval('a.csv', all => all.map(each => each.getAttribute('href')).sort()), FORMAT.reports
    .filter(report => report.has_csv_rows).map(({name}) => `csv/${name}.csv`).sort());
}));

// What a reader sees of a table, a folder, and what is open.
const state = page => page.evaluate(() => [
  document.querySelector('#large_file input').value, document.querySelectorAll('#large_file tbody tr').length,
  document.querySelector('#large_file tbody .name').textContent, document.querySelector('.trail b').textContent,
  document.querySelector('.choice :checked').value, document.querySelector('#file_age details').open,
  document.querySelector('#duplicate_file .below')?.previousSibling.textContent.replace(/[.,]/g, '')]);

test('another language, and the address, keep what a reader has done', () => withPage(fileOf('server'), async page => {
  await page.locator('#large_file thead button').first().click();
  await page.locator('#large_file input').fill('final');
  await page.locator('.choice label').nth(1).click();
  await page.locator('.box.way').first().focus();
  await page.keyboard.press('Enter');
  await page.locator('#file_age summary').first().click();
  await page.locator('#duplicate_file .more').click();
  await page.locator('#duplicate_file .opener').nth(150).click();
  await page.locator('#large_file').scrollIntoViewIfNeeded();
  const before = await state(page), top = await page.$eval('#large_file', each => each.getBoundingClientRect().top);
  assert.equal(before[4], 'week');
  // The second choice comes while the page is still being made.
  await page.$eval('header select', select => ['fr', 'de'].forEach(code => {
    const now = document.querySelector('header select');
    now.value = code;
    now.dispatchEvent(new Event('change'));
  }));
  await isReady(page);
  await page.locator('#duplicate_file .below').waitFor();
  assert.equal(await page.evaluate(() => document.documentElement.lang), 'de');
  assert.deepEqual(await state(page), before);
  assert.ok(Math.abs(await page.$eval('#large_file', each => each.getBoundingClientRect().top) - top) < 200, 'the place is kept');
  await page.reload();
  await isReady(page);
  assert.deepEqual((await state(page)).slice(0, 6), [...before.slice(0, 5), false], 'the address leads to what was seen');
  await page.locator('#duplicate_file .here').nth(3).click();
  await page.waitForFunction(() => document.querySelectorAll('#duplicate_file tbody tr').length === 1);
  await isReady(page);
  assert.deepEqual((await state(page)).slice(0, 5), before.slice(0, 5), 'a link takes nothing away');
  await page.goBack();
  await page.waitForFunction(() => document.querySelectorAll('#duplicate_file tbody tr').length === 200);
}));

test('a link is followed while another language is made, and one into a fold opens it', () => withPage(fileOf('server'), async page => {
  await page.evaluate(() => {
    const select = document.querySelector('header select');
    select.value = 'de';
    select.dispatchEvent(new Event('change'));
    document.querySelector('nav a[href="#large_file"]').click();
  });
  await isReady(page);
  assert.ok(Math.abs(await page.$eval('#large_file', each => each.getBoundingClientRect().top)) < 100);
  await page.goto(`file://${fileOf('server')}#file_owner?file_owner.by-share=!!CAD`);
  await page.locator('#file_owner details[open] tbody', {hasText: 'CAD'}).waitFor();
}));

test('one search looks in all tables', () => withPage(fileOf('server'), async page => {
  await page.locator('.search input').fill('anna');
  await page.waitForFunction(() => /\d/.test(document.querySelector('.search .hits').textContent));
  assert.ok(await page.locator('#file_owner tbody tr:visible').count() > 0);
  assert.equal(await page.locator('#duplicate_file:visible, #volumes:visible, nav a[href="#duplicate_file"]:visible').count(), 0);
  assert.ok(await page.locator('#file_owner details[open]').count() > 0);
  await page.locator('.search input').fill('');
  await page.locator('#volumes').waitFor();
  assert.equal(await page.locator('#duplicate_file:visible').count(), 1);
  assert.equal(await page.locator('#file_owner details[open]').count(), 0);
}));

test('a group of duplicates and an owner open to what they hold', () => withPage(fileOf('server'), async page => {
  for (const [name, below] of [['duplicate_file', '.copies li'], ['file_owner', '.below tbody tr']]) {
    await page.locator(`#${name} .opener`).first().click();
    assert.ok(await page.locator(`#${name} ${below}`).count() >= 2, name);
    await page.locator(`#${name} .opener`).first().click();
    assert.equal(await page.locator(`#${name} ${below}`).count(), 0, name);
  }
}));

test('growth has its sign, and is told where there is something to compare with', async () => {
  await withPage(fileOf('big'), async page => {
    const bars = (await textOf(page, '.growth-kind li')).map(row => row.replace(/\s+/g, ' ').trim());
    assert.ok(bars.includes('Photos +3 GiB') && bars.some(bar => /^Videos \u2212[\d.]+ \w+$/.test(bar)), bars.join('\n'));
    await openAll(page);
    const rows = (await textOf(page, '#growth tbody tr')).map(row => row.replace(/\s+/g, ' ').trim());
    assert.ok(rows.some(row => /^last report Share Photos \+3 GiB \+1$/.test(row)), rows.join('\n'));
    assert.ok(rows.some(row => /^last report File type Videos Video \u2212/.test(row)), rows.join('\n'));
    assert.match((await textOf(page, '#glance')).join(), /\/srv\/media grew by [\d.]+\sGiB since .*, mostly in Photos\/to sort and by anna/);
  });
  await withPage(fileOf('empty'), async page => assert.match((await section(page, 'growth')).notes[0], /keinen früheren Bericht/));
});

test('sizes tell their bytes to the keyboard', () => withPage(shares, async page => {
  const [share, , , volume] = await page.locator('#share_list thead button').all();
  await share.click();  // for an order in which the stop is another row
  await volume.press('Tab');
  for (const bytes of ['1,048,576', '5', '1,024', '0', '2,000', '2,000']) {
    assert.equal(await page.evaluate(() => getComputedStyle(document.activeElement, '::after').content), `"${bytes} bytes"`);
    await page.keyboard.press('ArrowDown');
  }
  assert.equal(await page.locator('#share_list .bytes[tabindex="0"]').count(), 1);
}));

test('the treemap is one stop, in which arrows move, Enter goes in and Esc out', () => withPage(fileOf('server'), async page => {
  const trail = () => page.locator('.trail > :is(button:not(.copy), b)').allInnerTexts();
  const first = () => page.locator('#folder_usage tbody th').first().innerText();
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
  assert.deepEqual([await trail(), await first()], [['All volumes', '/srv/projects'], 'Engineering']);
  await page.locator('.box.way', {hasText: 'CAD'}).focus();
  await page.keyboard.press('Enter');
  assert.deepEqual([await trail(), await first()], [['All volumes', '/srv/projects', 'CAD'], 'CAD']);
  await page.keyboard.press('Escape');
  await page.keyboard.press('Escape');
  assert.deepEqual(await trail(), ['All volumes']);
  // Free space and what lies outside the shares are drawn for each volume.
  assert.ok(await page.locator('.box.free').count() === 4 && await page.locator('.box.outside').count() > 0);
  await page.keyboard.press('Tab');
  assert.equal(await page.evaluate(() => document.activeElement.closest('.treemap')), null);
}));

test('types and owners are those of all files, however few rows the page has', () => withPage(fileOf('server'), async page => {
  const facts = JSON.parse(/var vornFacts = (.*);/.exec(read('server'))[1]);
  for (const [report, list, key] of [['file_group', facts.types, 'type'], ['file_owner', facts.owners, 'name']]) {
    assert.equal(await page.locator(`#${report} > .table tfoot th`).innerText(), `Total of ${list.length}`);
    const sum = Number(await page.locator(`#${report} > .table tfoot .size .bytes`).getAttribute('data-exact').then(text => text.replace(/\D/g, '')));
    assert.equal(sum, list.reduce((all, {bytes}) => all + bytes, 0), key);
  }
}));

test('an age has one colour, also where others are missing', () => withPage(read('hostile'), async page => {
  const legendOf = name => page.$$eval(`#${name} .legend li`, all => all.map(each => [each.textContent, each.className]));
  const all = await legendOf('folder_usage'), some = await legendOf('file_age');
  assert.ok(all.length === 7 && some.length < 7 && some.every(([text, colour]) => all.some(
    each => each[0] === text && each[1] === colour)), some.join());
}));

test('every drawing has its data as a table', () => withPage(fileOf('server'), async page => {
  await openAll(page);
  for (const [name, drawing] of [['volume_usage', '.history'], ['folder_usage', '.treemap'], ['file_group', '.stack'], ['file_age', '.stack'], ['growth', '.sides']]) {
    assert.ok(await page.locator(`#${name} ${drawing}`).count() > 0, name);
    assert.ok(await page.locator(`#${name} table:visible tbody tr`).count() > 5, name);
  }
  // All that the page has of the volumes, which is more than the facts have.
  await page.locator('.charts').press('Home');
  assert.equal(await page.locator('.charts').getAttribute('aria-valuenow'), '-179');
}));
