// Runs all tests of the page in one process, with one browser.
import fs from 'node:fs';

const here = new URL('.', import.meta.url);
for (const name of fs.readdirSync(here).filter(each => each.endsWith('.test.mjs')).sort()) {
  await import(new URL(name, here));
}
