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
export const axe = fs.readFileSync(require.resolve('axe-core/axe.min.js'), 'utf8');
export const fileOf = (name, file = 'report.html') => path.join(process.env.VORN_PAGES, name, file);
export const dictionary = code => JSON.parse(fs.readFileSync(path.join(SOURCE, `template/lang/${code}.json`), 'utf8'));
export const read = (name, file) => fs.readFileSync(fileOf(name, file), 'utf8');

const folder = fs.mkdtempSync('/var/tmp/vorn-page-');
let browser, copies = 0;
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

// Opens a page (its file, or its text, which then stands alone in a folder) and does `work` on it.
// Whatever the page says on the console or asks of the network fails the test.
export async function withPage(where, work, {address, silent = true, ...options} = {}) {
  let file = where;
  if (where.includes('<!DOCTYPE')) {
    file = path.join(folder, `${++copies}.html`);
    fs.writeFileSync(file, where);
  }
  const url = address ?? `file://${file}`;
  const context = await browser.newContext({
    viewport: {width: 1280, height: 800}, reducedMotion: 'reduce', ...options});
  try {
    const page = await context.newPage();
    const said = [];
    page.on('console', message => said.push(message.text()));
    page.on('pageerror', error => said.push(error.stack));
    page.on('dialog', dialog => said.push('a dialog') && dialog.dismiss());
    page.on('request', request => request.url().split('#')[0] === url ||
      said.push(`a request for ${request.url()}`));
    await page.goto(url);
    await work(page, said);
    if (silent) {
      assert.deepEqual(said, []);
    }
  } finally {
    await context.close();
  }
}

// A copy of a page whose block of `variable` is another: its text after `var NAME = `, or what
// stands in place of the whole element. The end of the head is what the product makes of it.
export function withBlock(page, variable, block) {
  const start = "<script type='text/javascript'>\n";
  const [head, body] = page.split(/<\/template>\n<\/head>\n<body.*>\n/);
  const text = /^[[{]/.test(block) ? `${start}var ${variable} = ${block}` : block;
  const old = new RegExp(`<script type='text/javascript'>\n(var vornDuplicateHashMatch.*\n)?var ${
    variable} = [^]*?</script>\n`);
  const copy = path.join(folder, 'head');
  fs.writeFileSync(copy, old.test(head) ? head.replace(old, () => text) : head + text);
  execFileSync(path.join(SOURCE, 'build-template.sh'), ['header', copy, 'share_list']);
  return fs.readFileSync(copy, 'utf8') + body;
}

export async function choose(page, language) {
  await page.locator('header select').first().selectOption(language);
}

export const textOf = (page, selector) => page.locator(selector).allInnerTexts();

// No slip of arithmetic may leave its traces anywhere, attributes and all.
export async function assertSensible(page) {
  const found = await page.evaluate(() => {
    const choice = document.querySelector('header select');
    return [...choice.options].map(({value}) => {
      const select = document.querySelector('header select');
      select.value = value;
      select.dispatchEvent(new Event('change'));
      const html = document.querySelector('header').outerHTML + document.querySelector('main').outerHTML;
      return /.{0,80}(NaN|Infinity|undefined|\bnull\b|(?<![\d.,])1970(?![\d.,])).{0,80}/.exec(html)?.[0];
    });
  });
  assert.deepEqual(found, LANGUAGES.map(() => undefined));
  await choose(page, 'en');
}

// What a reader finds in each section: notes, captions of its tables, and their rows of cells.
export const sections = page => page.evaluate(() => Object.fromEntries(
  [...document.querySelectorAll('section[data-report]')].map(part => {
    const texts = (root, selector) => [...root.querySelectorAll(selector)].map(
      element => element.textContent.replaceAll('\u00a0', ' '));
    return [part.id, {
      heading: part.querySelector('h2').textContent, notes: texts(part, '.note'),
      captions: texts(part, 'caption'),
      rows: [...part.querySelectorAll('tbody tr')].map(row => texts(row, 'th, td'))}];
  })));
export const section = async (page, name) => (await sections(page))[name];

// A server of a page, on loopback.
export async function serve(text, work) {
  const server = http.createServer((_, response) => response.setHeader('content-type', 'text/html').end(text));
  await new Promise(resolve => server.listen(0, '127.0.0.1', resolve));
  await work(`http://127.0.0.1:${server.address().port}/`);
  server.close();
}
