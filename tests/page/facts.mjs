// Facts for the pages under test, as the program would write them into the page.
import fs from 'node:fs';

import {fileOf, FORMAT, read, withBlock} from './browser.mjs';

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

// What the page holds of each report, and its CSV file of those that the page cuts.
function reportsOf(name, page) {
  return FORMAT.reports.map(({name: report, variable, page_limit: limit, has_csv_rows: hasCsv}) => {
    const block = new RegExp(`\nvar ${variable} = ([^]*?)</script>`).exec(page)?.[1] ?? '';
    const shown = block.match(/^\[ ?'/gm)?.length ?? 0;
    const csv = `csv/${report}.csv`;
    const written = fs.existsSync(fileOf(name, csv)) ? read(name, csv).trim().split('\n').length - 1 : 0;
    return {name: report, rows: limit ? Math.max(shown, written) : shown, shown,
            limit: limit || null, csv: hasCsv ? csv : null, ok: true};
  });
}

// State of the volumes of the page "big", by their ids; those of other pages are new.
const OUTLOOKS = {
  '/srv/projects': {level: 'warning', forecast: {
    ...growing(24, 19, 33), jump: {date: -5, bytes: 20 * GIB}}},
  '/srv/media': {level: 'ok', forecast: growing(81, 60, 120)},
  '/srv/home': {level: 'ok', forecast: growing(1461, 800, 2200)},
  '/srv/archive': {level: 'ok', forecast: {state: 'shrinking'}}
};

function volumesOf(page, now) {
  const [, block] = /\nvar vornVolumeUsageData = \[\n([^]*?)</.exec(page);
  return [...block.matchAll(/'(.*)', (\d+) , (\d+), '/g)].map(([, id, used, free]) => {
    const known = OUTLOOKS[id];
    const [held, size] = [Number(used), Number(used) + Number(free)];
    const {days, jump} = known?.forecast ?? {};
    const perDay = days ? Number(free) / days : 0;
    return volume(id, held, {
      size, level: known?.level,
      forecast: known ? {...known.forecast, jump: jump ? {...jump, date: now + jump.date * DAY} : null} :
        {state: 'short', window: 0, per_day: null},
      samples: known ? daily(90, ago => held - perDay * Math.min(ago, 60) -
        (ago > 5 ? jump?.bytes ?? 0 : 0), now) : [[now, held]]});
  }).sort((one, two) => Object.keys(OUTLOOKS).concat(one.id).indexOf(one.id) -
    Object.keys(OUTLOOKS).concat(two.id).indexOf(two.id));
}

const ATTENTION = [
  ['critical', 'quota_over', {user: 'anna', volume: '/srv/home', used: 108 * GIB, quota: 100 * GIB,
                              percent: 108}],
  ['warning', 'volume_fills', {volume: '/srv/projects', days: 24, days_low: 19, days_high: 33,
                               percent: 90.8, free: 94 * GIB, window: 30}],
  ['warning', 'quota_near', {user: 'bjoern', volume: '/srv/home', used: 56 * GIB, quota: 60 * GIB,
                             percent: 93.5}],
  ['warning', 'quota_more', {n: 2}], ['ok', 'share_largest', {share: 'Photos', bytes: 700 * GIB}],
  ['ok', 'owner_most', {owner: 'anna', bytes: 900 * GIB}],
  ['ok', 'duplicates_possible', {bytes: 1.25 * GIB, groups: 24}],
  ['ok', 'data_oldest', {date: 1500000000, file: 'scan 2019/plan.dwg'}]];

export const attention = ([level, code, values]) => (
  {level, code, values, section: FORMAT.attention[code].section});

const pages = new Map();
// The page `name` as the program would make it, facts and all.
export function pageOf(name) {
  if (!pages.has(name)) {
    const page = read(name);
    const [, time] = /data-time="(\d+)"/.exec(page);
    pages.set(name, withFacts(page, facts({
      host: 'vm', profile: name, finished: Number(time), quotas: [], volumes: volumesOf(page, Number(time)),
      attention: name === 'big' ? ATTENTION.map(attention) : [], reports: reportsOf(name, page)})));
  }
  return pages.get(name);
}
