// Facts for the pages under test, as the program would write them into the page.
import {FORMAT, withBlock} from './browser.mjs';

export const DAY = 86400, GIB = 2 ** 30, NOW = 1700000000;  // 14 November 2023

// A volume of 1000 GiB by default; `forecast` is what differs from "does not grow".
export function volume(id, used, {size = 1000 * GIB, forecast, samples, ...fields} = {}) {
  return {
    id, path: id, size, used, free: size - used, percent: size ? used / size * 100 : 0, level: 'ok',
    forecast: {state: 'steady', days: null, days_low: null, days_high: null, per_day: 0, window: 89,
               jump: null, ...forecast},
    samples: samples ?? daily(90, () => used), explained: null, outside: null, filled_by: null,
    grown_by: null, ...fields
  };
}

// A sample on each of the last `days` days; `used` of how many days ago it was.
export const daily = (days, used, now = NOW) => Array.from(
  {length: days}, (_, i) => [now - (days - 1 - i) * DAY, Math.round(used(days - 1 - i))]);

export const growing = (days, low, high, window = 30) => ({
  state: 'growing', days, days_low: low, days_high: high, per_day: GIB, window});

export const incident = (level, kind, what, text = `About ${what}.`) => ({level, kind, what, text});

export const facts = fields => ({
  format: 1, host: 'files.example', profile: 'weekly', time_zone: 'Etc/UTC', language: 'en',
  started: NOW - 60, finished: NOW, complete: true, incidents: [], volumes: [], shares: null,
  owners: null, types: null, ages: null, quotas: null, duplicates: null, attention: [], reports: [],
  ...fields
});

export const textOfFacts = value => JSON.stringify(value).replace(
  /[<\u007f-\uffff]/g, character => `\\u${character.charCodeAt(0).toString(16).padStart(4, '0')}`);

// A copy of a page with these facts in place of its own.
export const withFacts = (page, value) =>
  withBlock(page, FORMAT.facts_variable, `${textOfFacts(value)};\n</script>\n`);

export const attention = ([level, code, values]) => (
  {level, code, values, section: FORMAT.attention[code].section});
