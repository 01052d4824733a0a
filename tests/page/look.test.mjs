// What axe finds, narrow screens, forced colours, and print.
import assert from 'node:assert/strict';
import test from 'node:test';

import {axe, choose, LANGUAGES, read, withPage} from './browser.mjs';
import {DAY, facts, growing, incident, NOW, pageOf, volume, withFacts} from './facts.mjs';

const NARROW = {viewport: {width: 390, height: 844}}, ZOOMED = {viewport: {width: 640, height: 400}, deviceScaleFactor: 2};
const open = (page, value) => page.$$eval('details', (all, to) => all.forEach(each => { each.open = to; }), value);

// All that facts can bring: incidents, long names, each level, a jump; and none of them.
const rich = withFacts(read('hostile'), facts({
  complete: false, incidents: ['error', 'warning'].map(level => incident(level, 'report_failed', 'large_file', 'x'.repeat(300))),
  volumes: ['ok', 'warning', 'critical'].map((level, i) => volume(`/srv/${'long name '.repeat(8 * i)}`, 9, {
    size: 10, level, forecast: {...growing(24, 19, 33), jump: {date: NOW - DAY, bytes: 5}}})),
  attention: [{level: 'critical', code: 'volume_full', values: {volume: `/srv/${'x'.repeat(200)}`}, section: 'volume_usage'}]}));
const bare = withFacts(read('hostile'), null);
const PAGES = {big: pageOf('big'), rich};

async function assertAccessible(page) {
  await page.evaluate(axe);
  const {violations} = await page.evaluate(() => window.axe.run());
  assert.deepEqual(violations.map(({id, nodes}) => [id, ...nodes.slice(0, 3).map(({html}) => html)]), []);
}

test('axe finds nothing', async t => {
  await withPage(bare, assertAccessible);
  for (const [name, text] of Object.entries(PAGES)) {
    for (const [look, options] of Object.entries({light: {}, dark: {colorScheme: 'dark'}, narrow: NARROW})) {
      await t.test(`${name}, ${look}`, () => withPage(text, async page => {
        await assertAccessible(page);
        await open(page, true);
        await page.waitForTimeout(100);  // a table is filled when it is opened
        await assertAccessible(page);
      }, options));
    }
  }
});

test('narrow and zoomed, nothing is cut off', async t => {
  for (const [name, text] of Object.entries(PAGES)) {
    for (const [look, options] of Object.entries({narrow: NARROW, zoomed: ZOOMED})) {
      await t.test(`${name}, ${look}`, () => withPage(text, async page => {
        for (const language of LANGUAGES) {
          await choose(page, language);
          await open(page, true);
          const {width} = options.viewport;
          const today = name === 'big' && await page.locator('.history .today').boundingBox();
          assert.ok(!today || (today.x > 0 && today.x < width), 'today is in view');
          assert.ok(await page.evaluate(() => document.documentElement.scrollWidth) <= width, language);
          for (const cell of ['th.file .name', 'td.size .bytes']) {
            const box = await page.locator(`#large_file tbody tr:visible ${cell}`).first().boundingBox();
            assert.ok(box.x >= 0 && box.x + box.width <= width, `${language}: ${cell} ${JSON.stringify(box)}`);
          }
        }
      }, options));
    }
  }
});

test('forced colours leave the drawings visible', async () => {
  for (const colorScheme of ['light', 'dark']) {
    await withPage(PAGES.big, async page => {
      await page.emulateMedia({forcedColors: 'active'});
      for (const [part, property] of [
        ['.gauge .value', 'fill'], ['.gauge .track', 'fill'], ['.leaf rect', 'fill'], ['.stack rect', 'fill'],
        ['.history .line .forecast', 'stroke'], ['.history .line .range', 'fill'], ['.barred .bar', 'backgroundColor'], ['.legend li', '::before']]) {
        const [own, ground] = await page.locator(part).first().evaluate((element, name) => [
          name === '::before' ? getComputedStyle(element, name).backgroundColor : getComputedStyle(element)[name],
          getComputedStyle(document.body).backgroundColor], property);
        assert.ok(own !== ground && !/^(none|transparent|rgba\(.*, 0\))$/.test(own), `${part}: ${own} on ${ground}`);
      }
    }, {colorScheme});
  }
});

test('a print has all rows, unfolded, on white, and nothing to press', async () => {
  await withPage(PAGES.big, async page => {
    await page.emulateMedia({media: 'print'});
    await page.evaluate(() => window.dispatchEvent(new Event('beforeprint')));
    assert.equal(await page.locator('button:not(thead button):visible, select:visible, input:visible, nav:visible, a.csv:visible, summary:visible').count(), 0);
    assert.equal(await page.locator('#large_file tbody tr:visible').count(), 200);
    assert.equal(await page.locator('details:not([open])').count(), 0);
    assert.ok(await page.locator('#volume_usage details tbody tr:visible').count() > 300);
    const [ground, text] = await page.evaluate(() => [getComputedStyle(document.body).backgroundColor, getComputedStyle(document.body).color]);
    assert.deepEqual([ground, text], ['rgb(255, 255, 255)', 'rgb(0, 0, 0)']);
    await page.evaluate(() => window.dispatchEvent(new Event('afterprint')));
    assert.equal(await page.locator('details[open]').count(), 0);
    await page.emulateMedia({media: null});
    const pdf = await page.pdf({preferCSSPageSize: true});
    const pages = pdf.toString('latin1').match(/\/Type\s*\/Page\b/g).length;
    assert.ok(pages > 5 && pages < 80, `${pages} pages`);
  }, {colorScheme: 'dark'});
});
