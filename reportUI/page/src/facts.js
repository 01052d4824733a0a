// The facts of the run: what the program has found out and judged, as the page's block has them.
// The page repeats them and judges nothing itself.
//
// A value that is missing or of another kind counts as its default, so that a block that somebody
// has touched throws nowhere.
import {facts_variable as VARIABLE} from 'report_format';

import {readJson} from './data.js';

const FORMAT = 1;
const LARGEST = 2 ** 64, LATEST = 32503680000;  // the year 3000

const text = value => typeof value === 'string' ? value : '';
const number = value => Math.abs(value) <= LARGEST && typeof value === 'number' ? value : 0;
const time = value => number(value) > 0 && value < LATEST ? value : 0;
const optional = read => value => value === undefined || value === null ? undefined : read(value);
const oneOf = (...words) => value => words.includes(value) ? value : words[0];
const list = read => value => Array.isArray(value) ? value.map(entry => read(entry)) : [];
const record = fields => value => Object.fromEntries(Object.entries(fields).map(
  ([key, read]) => [key, read(value?.[key])]));

const level = oneOf('ok', 'warning', 'critical');
const forecast = record({
  state: oneOf('short', 'full', 'growing', 'shrinking', 'steady'), window: number,
  days: optional(number), days_low: optional(number), days_high: optional(number),
  per_day: optional(number), jump: optional(record({date: time, bytes: number}))
});
const cause = record({kind: text, share: text, name: text, bytes: number, since: optional(time)});
const since = optional(record({since: time, files: number, bytes: number}));
const grown = optional(record({last: since, week: since, month: since}));
const sample = value => ({date: time(value?.[0]), used: number(value?.[1]), size: optional(number)(value?.[2])});
const volumes = list(record({id: text, path: text, size: number, used: number, free: number,
                             percent: number, level, forecast, samples: list(sample),
                             explained: optional(number), outside: optional(number),
                             filled_by: list(cause), grown_by: optional(list(cause))}));

const readFields = record({
  host: text, profile: text, time_zone: text, finished: time,
  complete: value => value !== false,
  incidents: list(record({level: oneOf('warning', 'error'), kind: text, what: text, text})),
  volumes,
  shares: optional(list(record({name: text, path: text, volume: text, files: number, bytes: number,
                                index: value => value === true, grown, samples: list(sample)}))),
  owners: optional(list(record({name: text, files: number, bytes: number, grown, places: list(record({
    share: text, volume: text, files: number, bytes: number}))}))),
  types: optional(list(record({type: text, files: number, bytes: number, grown, shares: list(record({
    share: text, files: number, bytes: number}))}))),
  ages: optional(list(record({age: text, files: number, bytes: number}))),
  quotas: optional(list(() => null)),
  duplicates: optional(record({mode: text, groups: number, files: number, reclaimable: number})),
  attention: list(record({level, code: text, section: text, values: value => value ?? {}})),
  reports: list(record({name: text, rows: number, shown: number, limit: optional(number),
                        csv: optional(text), ok: value => value !== false}))
});

const readIndex = record({
  host: text, profile: text, time_zone: text, language: text, volumes,
  reports: list(record({name: text, made: time, level: optional(level), complete: value => value !== false,
                        used: optional(number), grown: optional(number)}))
});

const withDates = parts => parts.forEach(each => {
  each.samples = each.samples.filter(({date}) => date > 0);
});

// What stands beside all reports of a profile: each of them, the oldest first and without figures
// where its facts can't be read, and the volumes of the newest with a sample {date, used, size} of
// each report.
export function readReports(json) {
  const index = readIndex(json);
  withDates(index.volumes);
  return index;
}

// The facts by their keys, with `reports` as a Map by name and samples as {date, used}; undefined
// when they are missing or broken. `isFleet`: they are of more servers, see pathOf() in sections.js.
export function readFacts(pieces) {
  const json = readJson(pieces, VARIABLE);
  if (json?.format !== FORMAT) {
    return undefined;
  }
  const facts = readFields(json);
  withDates([...facts.volumes, ...facts.shares ?? []]);
  facts.reports = new Map(facts.reports.map(report => [report.name, report]));
  // A server's volumes are paths; with others' beside them each begins with its server's name.
  facts.isFleet = [...facts.volumes.map(({path}) => path), ...facts.shares?.map(({volume}) => volume) ?? []]
    .some(path => path && !path.startsWith('/'));
  return facts;
}
