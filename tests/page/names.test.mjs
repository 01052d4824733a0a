// Names that anybody may have chosen: inert, shown as they are, and whole on the clipboard.
import assert from 'node:assert/strict';
import test from 'node:test';

import {fileOf, read, section, serve, withBlock, withPage} from './browser.mjs';
import {facts, volume, withFacts} from './facts.mjs';

const names = JSON.parse(read('', 'names.json'));  // path, and how it is to be shown

// Over http on loopback, where a page may use the clipboard.
const withClipboard = (name, work) => serve(read(name), address => withPage(
  '', page => work(page, () => page.evaluate(() => navigator.clipboard.readText())),
  {address, permissions: ['clipboard-read', 'clipboard-write']}));

test('names are shown exactly and do nothing', () => withPage(fileOf('hostile'), async page => {
  assert.match(await page.title(), /^Storage report – /);
  assert.equal(await page.locator('main img, main script, main iframe, main a[href^="http"]').count(), 0);
  await page.locator('#large_file .more').click();
  const rows = await page.$$eval('#large_file tbody .path bdi', all => all.map(each => {
    each.querySelectorAll('.chip').forEach(chip => { chip.textContent = `[${chip.textContent}]`; });
    return each.textContent;
  }));
  const paths = rows.reduce((all, each, i) => i % 2 ? [...all.slice(0, -1), all.at(-1) + each] : [...all, each], []);
  assert.deepEqual(paths.slice(1, 1 + names.length), names.map(([, shown]) => shown));
  // The two shares, by their volume; and accounts that are no names of JavaScript.
  assert.deepEqual((await section(page, 'share_list')).rows.map(row => row[0]), ['big & small', 'docs']);
  assert.deepEqual((await section(page, 'file_group')).captions, ['File types', 'All files', 'john-doe', '007']);
  assert.equal((await section(page, 'duplicate_file')).heading, 'Confirmed duplicates (same content)');
}));

const withFolders = size => withFacts(withBlock(
  read('hostile'), 'vornFolderUsageData', `[\n${['.', 'a ?#%\\udcff', 'a ?#%\\udcff/b'].map(
    (folder, i) => `[ 's', '${folder}', '${9 - i}', '1', '1700000000' ]`).join(',\n')}\n];\n</script>\n`), facts({
  volumes: [volume('/x', 9, {size})], shares: [{name: 's', path: '/x/s', volume: '/x', files: 1, bytes: 9, samples: []}]}));

// Bytes that are no UTF-8 stand in the address as they are.
test('a folder of any name can be gone into, and has an address', () => withPage(withFolders(18), async page => {
  await page.locator('.box.way', {hasText: 's: 9'}).press('Enter');
  await page.locator('.box.way', {hasText: 'a ?#%'}).press('Enter');
  assert.equal(await page.locator('.go').getAttribute('href'), 'file:///x/s/a%20%3F%23%25%ff');
  assert.equal(await page.locator('.trail .chip').innerText(), '\\xff');
}));

test('a share too small to be seen in its volume is gone into', () => withPage(withFolders(9000), async page => {
  assert.deepEqual(await page.locator('.trail > :is(button:not(.copy), b)').allInnerTexts(), ['All volumes', '/x', 's']);
}));

test('the clipboard gets the names themselves', () => withClipboard('hostile', async (page, clipboard) => {
  await page.locator('#large_file .more').click();
  for (const [i, [path]] of names.entries()) {
    const line = page.locator('#large_file tbody tr').nth(i + 1);
    await line.locator('.copy').click();
    await line.locator('.said').waitFor();
    const copied = await clipboard();
    if (/[\udc80-\udcff]/.test(path)) {
      assert.equal(copied, `$'${path.replace(/'/g, "\\'").replace('\udcff', '\\xff').replace('\udcc3', '\\xc3')}'`);
    } else {
      assert.equal(copied, path);
      await page.evaluate(at => {
        const cell = document.querySelectorAll('#large_file tbody tr')[at].querySelector('.path > span');
        getSelection().selectAllChildren(cell);
      }, i + 1);
      await page.evaluate(() => navigator.clipboard.writeText(''));
      await page.keyboard.press('Control+C');
      await page.waitForFunction(() => navigator.clipboard.readText());
      assert.equal(await clipboard(), path);
    }
  }
  // Rows: a line each, cells parted by tabs, and no words of buttons.
  await page.evaluate(() => getSelection().selectAllChildren(document.querySelector('#large_file tbody')));
  await page.keyboard.press('Control+C');
  const lines = await clipboard();
  assert.ok(lines.includes(`\tbig & small`) && lines.includes('\u202egpj.exe\t'), lines);
}));
