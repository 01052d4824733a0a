// The pages under test in a real browser. VORN_PAGES is a folder with a folder for each report that
// test_page.py has had made; VORN_NODE_MODULES holds the browser's driver, VORN_FORMAT is the build's
// report_format.json.
import assert from 'node:assert/strict';
import {execFileSync} from 'node:child_process';
import fs from 'node:fs';
import http from 'node:http';
import {createRequire} from 'node:module';
import path from 'node:path';
import {after, before} from 'node:test';
import {fileURLToPath} from 'node:url';

const require = createRequire(path.join(process.env.VORN_NODE_MODULES, 'from-here.js'));
const {chromium} = require('playwright-core');
const here = path.dirname(fileURLToPath(import.meta.url));

export const SOURCE = path.join(here, '../../reportUI');
export const LANGUAGES = ['de', 'en', 'es', 'fr', 'ja', 'zh'];
export const FORMAT = JSON.parse(fs.readFileSync(process.env.VORN_FORMAT, 'utf8'));
export const ALL = FORMAT.reports.map(({name}) => name);
const axe = fs.readFileSync(require.resolve('axe-core/axe.min.js'), 'utf8');
export const fileOf = (name, file = 'report.html') => path.join(process.env.VORN_PAGES, name, file);
export const dictionary = code => JSON.parse(fs.readFileSync(path.join(SOURCE, `template/lang/${code}.json`), 'utf8'));
export const read = (name, file) => fs.readFileSync(fileOf(name, file), 'utf8');

const folder = fs.mkdtempSync('/var/tmp/vorn-page-');
let browser, copies = 0;
const contexts = new Map();  // a tab for each kind of reader, for one costs more than a page
before(async () => {
  browser = await chromium.launch({
    executablePath: '/usr/bin/chromium', env: {...process.env, HOME: folder},
    args: ['--headless', '--no-sandbox', '--disable-gpu', '--disable-quic', '--no-first-run',
           '--disable-background-networking', '--disable-component-update', '--disable-sync']});
});
after(async () => {
  await browser?.close();
  fs.rmSync(folder, {recursive: true, force: true});
});

// The page is filled piece by piece, and drawings learn their width in the frame after that.
export async function isReady(page) {
  await page.locator('body[data-ready]').waitFor({state: 'attached'});
  await page.evaluate(() => new Promise(done => { requestAnimationFrame(() => setTimeout(done)); }));
}

// What is folded is made when it is opened, and so is what is folded in that.
export const openAll = page => page.evaluate(() => {
  for (let each; (each = document.querySelector('details:not([open]) > summary'));) {
    each.click();
  }
});

// Opens a page (its file, or its text, which then stands alone in a folder) and does `work` on it.
// Whatever the page says on the console or asks of the network fails the test.
export async function withPage(where, work, {address, silent = true, ...options} = {}) {
  let file = where;
  if (where.includes('<!DOCTYPE')) {
    file = path.join(folder, `${++copies}.html`);
    fs.writeFileSync(file, where);
  }
  const url = address ?? `file://${file}`;
  const kind = JSON.stringify(options);
  if (!contexts.has(kind)) {
    contexts.set(kind, await browser.newContext({viewport: {width: 1280, height: 800}, reducedMotion: 'reduce', ...options}));
  }
  const context = contexts.get(kind);
  const page = context.pages()[0] ?? await context.newPage();
  const said = [];
  const listeners = {
    console: message => said.push(message.text()), pageerror: error => said.push(error.stack),
    dialog: dialog => said.push('a dialog') && dialog.dismiss(),
    request: request => request.url().split('#')[0] === url || said.push(`a request for ${request.url()}`)
  };
  try {
    Object.entries(listeners).forEach(([name, listener]) => page.on(name, listener));
    await page.mouse.move(0, 0);  // what lies below the pointer would answer to it
    await page.goto(url);
    if (options.javaScriptEnabled !== false) {
      await isReady(page);
    }
    await work(page, said);
    if (silent) {
      assert.deepEqual(said, []);
    }
  } finally {
    Object.entries(listeners).forEach(([name, listener]) => page.off(name, listener));
    await page.evaluate(() => localStorage.clear());
    await page.emulateMedia({media: null, forcedColors: null, colorScheme: options.colorScheme ?? null});
  }
}

// A copy of a page whose blocks of some variables are others: the text after `var NAME = `, or what
// stands in place of the whole element. The end of the head is what the product makes of it.
export function withBlocks(page, blocks) {
  const start = "<script type='text/javascript'>\n";
  let [head, body] = page.split(/<\/template>\n<\/head>\n<body.*>\n/);
  for (const [variable, block] of blocks) {
    const text = /^[[{]/.test(block) ? `${start}var ${variable} = ${block}` : block;
    const old = new RegExp(`<script type='text/javascript'>\n(var vornDuplicateHashMatch.*\n)?var ${
      variable} = [^]*?</script>\n`);
    head = old.test(head) ? head.replace(old, () => text) : head + text;
  }
  const copy = path.join(folder, 'head');
  fs.writeFileSync(copy, head);
  execFileSync(path.join(SOURCE, 'build-template.sh'), ['header', copy, 'share_list']);
  return fs.readFileSync(copy, 'utf8') + body;
}
export const withBlock = (page, variable, block) => withBlocks(page, [[variable, block]]);

export async function choose(page, language) {
  await page.locator('header select').first().selectOption(language);
  await isReady(page);
}

// Nothing of what axe looks for, light and dark. Colours are all that the dark has of its own, and a
// table's rows are all alike.
export async function assertAccessible(page) {
  await page.evaluate(axe);
  for (const [colorScheme, rules] of [['light', {}], ['dark', {runOnly: ['color-contrast']}]]) {
    await page.emulateMedia({colorScheme});
    const {violations} = await page.evaluate(only => window.axe.run({exclude: ['tbody tr:nth-child(n+5)']}, {
      resultTypes: ['violations'], selectors: false, ...only}), rules);
    assert.deepEqual(violations.map(({id, nodes}) => [colorScheme, id, ...nodes.slice(0, 3).map(({html}) => html)]), []);
  }
}

export const textOf = (page, selector) => page.locator(selector).allInnerTexts();

// No slip of arithmetic may leave its traces anywhere, attributes and all.
export async function assertSensible(page) {
  await openAll(page);
  const html = await page.evaluate(
    () => document.querySelector('header').outerHTML + document.querySelector('main').outerHTML);
  assert.equal(/.{0,80}(NaN|Infinity|undefined|\bnull\b|\[object|(?<![\d.,])1970(?![\d.,])).{0,80}/.exec(html)?.[0], undefined);
}

// What a reader finds in each section: notes, captions of its tables, and their rows of cells.
export const sections = page => openAll(page).then(() => page.evaluate(() => Object.fromEntries(
  [...document.querySelectorAll('section[data-report]')].map(part => {
    const texts = (root, selector) => [...root.querySelectorAll(selector)].map(
      element => element.textContent.replaceAll('\u00a0', ' '));
    return [part.id, {
      heading: part.querySelector('h2').textContent, notes: texts(part, '.note'),
      captions: texts(part, 'caption'),
      rows: [...part.querySelectorAll('tbody tr')].map(row => texts(row, 'th, td'))}];
  }))));
export const section = async (page, name) => (await sections(page))[name];

// A server of a page, on loopback.
export async function serve(text, work) {
  const server = http.createServer((_, response) => response.setHeader('content-type', 'text/html').end(text));
  await new Promise(resolve => server.listen(0, '127.0.0.1', resolve));
  await work(`http://127.0.0.1:${server.address().port}/`);
  server.close();
}
