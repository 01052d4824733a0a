// How heavy a page is: first paint, longest task, elements at the start, and pages of a print.
//
//   node bench/page.mjs BUILD KIND...     kinds of tools/demo_page.py; five loads each, the median
import {execFileSync} from 'node:child_process';
import fs from 'node:fs';
import {createRequire} from 'node:module';
import path from 'node:path';
import {fileURLToPath} from 'node:url';

const LOADS = 5;
const here = path.dirname(fileURLToPath(import.meta.url));
const [build, ...kinds] = process.argv.slice(2);
const {chromium} = createRequire(path.resolve(build, 'reportUI/page/node_modules/from-here.js'))('playwright-core');

// Runs in the page before anything of it does.
function watch() {
  window.tasks = [0];
  new PerformanceObserver(list => list.getEntries().forEach(({duration}) => window.tasks.push(duration)))
    .observe({type: 'longtask', buffered: true});
}
const figures = () => ({
  paint: performance.getEntriesByName('first-contentful-paint')[0].startTime,
  task: Math.max(...window.tasks), elements: document.querySelectorAll('*').length});

async function load(browser, file) {
  const context = await browser.newContext({viewport: {width: 1280, height: 800}});
  const page = await context.newPage();
  await page.addInitScript(watch);
  await page.goto(`file://${file}`);
  await page.locator('body[data-ready]').waitFor({state: 'attached'});
  const found = await page.evaluate(figures);
  const print = (await page.pdf({preferCSSPageSize: true})).toString('latin1');
  await context.close();
  return {...found, print: print.match(/\/Type\s*\/Page\b/g).length};
}

const folder = fs.mkdtempSync('/var/tmp/vorn-bench-page-');
const browser = await chromium.launch({executablePath: '/usr/bin/chromium', args: ['--headless', '--no-sandbox', '--disable-gpu']});
try {
  for (const kind of kinds) {
    execFileSync(path.join(here, '../tools/demo_page.py'), [`${folder}/${kind}`, '--kind', kind, '--build', build]);
    const loads = [];
    for (let i = 0; i < LOADS; ++i) {
      loads.push(await load(browser, `${folder}/${kind}/report.html`));
    }
    const median = key => loads.map(each => each[key]).sort((one, two) => one - two)[Math.floor(LOADS / 2)];
    console.log(`${kind}: first paint ${median('paint').toFixed(0)} ms, longest task ${
      median('task').toFixed(0)} ms, ${median('elements')} elements, ${median('print')} pages in print`);
  }
} finally {
  await browser.close();
  fs.rmSync(folder, {recursive: true, force: true});
}
