// What axe finds, narrow screens, forced colours, and print.
import assert from 'node:assert/strict';
import test from 'node:test';

import {assertAccessible, choose, LANGUAGES, openAll, read, withPage} from './browser.mjs';
import {DAY, facts, growing, incident, NOW, volume, withFacts} from './facts.mjs';

const NARROW = {viewport: {width: 390, height: 844}}, ZOOMED = {viewport: {width: 640, height: 400}, deviceScaleFactor: 2};
// All that facts can bring: incidents, long names, each level, a jump; and none of them.
const rich = withFacts(read('hostile'), facts({
  complete: false, incidents: ['error', 'warning'].map(level => incident(level, 'report_failed', 'large_file', 'x'.repeat(300))),
  volumes: ['ok', 'warning', 'critical'].map((level, i) => volume(`/srv/${'long name '.repeat(8 * i)}`, 9, {
    size: 10, level, forecast: {...growing(24, 19, 33), jump: {date: NOW - DAY, bytes: 5}}})),
  attention: [{level: 'critical', code: 'volume_full', values: {volume: `/srv/${'x'.repeat(200)}`}, section: 'volume_usage'}]}));
const bare = withFacts(read('hostile'), null);
const PAGES = {server: read('server'), rich};

// The small page has what is folded on the large one.
test('axe finds nothing', async t => {
  await withPage(bare, page => assertAccessible(page));
  for (const [name, look, options] of [['server', 'wide', {}], ['rich', 'wide', {}], ['rich', 'narrow', NARROW]]) {
    await t.test(`${name}, ${look}`, () => withPage(PAGES[name], async page => {
      if (name === 'rich') {
        await openAll(page);
        await page.$$eval('.opener', all => all.slice(0, 2).forEach(each => each.click()));
      }
      await assertAccessible(page);
    }, options));
  }
});

test('narrow and zoomed, nothing is cut off', async t => {
  for (const [name, text] of Object.entries(PAGES)) {
    for (const [look, options] of Object.entries({narrow: NARROW, zoomed: ZOOMED})) {
      await t.test(`${name}, ${look}`, () => withPage(text, async page => {
        if (name === 'rich') {
          await openAll(page);
        }
        const {width} = options.viewport;
        for (const language of look !== 'narrow' ? ['en'] : name === 'rich' ? LANGUAGES : ['es', 'en']) {
          await choose(page, language);
          assert.ok(await page.evaluate(() => document.documentElement.scrollWidth) <= width, language);
          for (const cell of ['th.file .name', 'td.size .bytes']) {
            const box = await page.locator(`#large_file tbody tr:visible ${cell}`).first().boundingBox();
            assert.ok(box.x >= 0 && box.x + box.width <= width, `${language}: ${cell} ${JSON.stringify(box)}`);
          }
        }
        // Drawings have the width of the screen, and their letters the size they have elsewhere.
        const letters = await page.$$eval('.history, .treemap', all => all.map(
          each => each.getBoundingClientRect().width / each.viewBox.baseVal.width));
        assert.ok(letters.every(scale => Math.abs(scale - 1) < .05), letters.join());
        if (look === 'narrow' && name === 'server') {
          const [attention, volumes] = await page.$$eval('#attention, #volumes', all => all.map(each => each.getBoundingClientRect().top));
          assert.ok(attention < volumes, 'what needs attention comes first');
        }
      }, options));
    }
  }
});

test('forced colours leave the drawings visible', async () => {
  for (const colorScheme of ['light', 'dark']) {
    await withPage(PAGES.server, async page => {
      await page.emulateMedia({forcedColors: 'active'});
      for (const [part, property] of [
        ['.meter .value', 'backgroundColor'], ['.meter', 'backgroundColor'], ['.box rect', 'fill'], ['.stack span', 'backgroundColor'],
        ['.line .forecast', 'stroke'], ['.line .range', 'fill'], ['.barred .bar', 'backgroundColor'], ['.sides .more-of', 'backgroundColor'], ['.legend li', '::before']]) {
        const [own, ground] = await page.locator(part).first().evaluate((element, name) => [
          name === '::before' ? getComputedStyle(element, name).backgroundColor : getComputedStyle(element)[name],
          getComputedStyle(document.body).backgroundColor], property);
        assert.ok(own !== ground && !/^(none|transparent|rgba\(.*, 0\))$/.test(own), `${part}: ${own} on ${ground}`);
      }
    }, {colorScheme});
  }
});

test('a print has what is shown, on white, on few pages, and nothing to press', async () => {
  await withPage(PAGES.server, async page => {
    await page.emulateMedia({media: 'print'});
    assert.equal(await page.locator('button:not(thead button, .trail button):visible, select:visible, input:visible, nav:visible, a.csv:visible, summary:visible').count(), 0);
    assert.equal(await page.locator('#large_file tbody tr:visible').count(), 10);
    const [ground, text] = await page.evaluate(() => [getComputedStyle(document.body).backgroundColor, getComputedStyle(document.body).color]);
    assert.deepEqual([ground, text], ['rgb(255, 255, 255)', 'rgb(0, 0, 0)']);
    await page.emulateMedia({media: null});
    const pagesOf = async () => (await page.pdf({preferCSSPageSize: true})).toString('latin1').match(/\/Type\s*\/Page\b/g).length;
    const few = await pagesOf();
    assert.ok(few > 2 && few <= 10, `${few} pages`);
    // Drawings are made anew for the paper, and for the screen again.
    const widthAfter = name => page.evaluate(event => {
      dispatchEvent(new Event(event));
      return document.querySelector('.history').viewBox.baseVal.width;
    }, name);
    assert.ok(await widthAfter('beforeprint') < 400 && await widthAfter('afterprint') > 500);
    // Everything is there for who asks for it.
    await page.evaluate(() => { window.print = () => { document.title = 'printed'; }; });
    await page.locator('.everything').click();
    await page.waitForFunction(() => document.title === 'printed');
    assert.equal(await page.locator('#large_file tbody tr').count(), 200);
    assert.equal(await page.locator('details:not([open])').count(), 0);
    await page.evaluate(() => dispatchEvent(new Event('afterprint')));
    assert.deepEqual([await page.locator('#large_file tbody tr').count(), await page.locator('details[open]').count()], [10, 0]);
  }, {colorScheme: 'dark'});
});
