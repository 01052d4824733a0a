// The first look: what the run has found that needs attention, and what went wrong with it. The
// facts say both by codes, the dictionaries in words.
import {attention as FORMATS} from 'report_format';

import {h, shown} from './dom.js';
import {fold} from './folds.js';
import * as format from './format.js';
import {fillsText} from './outlook.js';
import {ageOrder, sizeElement} from './table.js';
import {levelElement} from './volumes.js';

// Lines that stand open.
const MOST_INCIDENTS = 5, MOST_WORRIES = 6, MOST_CALM = 5;
const FEW_MORE = 2;  // that are shown rather than asked for

// How a value is shown, by the kind that the program gives it.
const KINDS = {
  name: value => shown(String(value)),
  bytes: value => sizeElement(value, null),
  percent: format.percent,
  days: value => format.figure(value),
  count: format.number,
  time: format.day
};

function valuesOf({code, values}) {
  const kinds = Object.hasOwn(FORMATS, code) ? FORMATS[code].values : {};
  const elements = Object.fromEntries(Object.entries(kinds).map(
    ([name, kind]) => [name, values[name] === undefined ? format.UNKNOWN :
      KINDS[kind](values[name])]));
  return 'days' in kinds ? {...elements, outlook: fillsText(values)} : elements;
}

function line(level, mark, ...content) {
  return h('li', {class: level}, mark, h('div', {}, ...content));
}

// A link to a report's section; the bare text when the page has none.
const linkTo = (report, sections, text) => sections.has(report) ?
  h('a', {href: `#${report}`}, ...text) : h('span', {}, ...text);

function attentionLine(entry, sections) {
  const {level, code, section} = entry;
  return line(level, level === 'ok' ? null : levelElement(level, false),
              linkTo(section, sections, format.sayNodes(code, valuesOf(entry), 'attention')));
}

// A list of which a long one's rest is folded, and says how many there are.
function cutList(lines, most, key) {
  const list = part => h('ul', {class: 'notices'}, ...part);
  const count = lines.length <= most + FEW_MORE ? lines.length : most;
  return h('div', {}, list(lines.slice(0, count)), lines.length > count ? fold(
    key, format.say('andMore', {n: format.number(lines.length - count)}), list(lines.slice(count))) : null);
}

const isWorry = ({level}) => level !== 'ok';
const isGain = ({code}) => code.startsWith('duplicates_');  // what can be done about it, see next()

// What needs attention, each line with a link to its section. `sections`: names of those that the
// page has. Null when the run has looked at nothing that may need some.
export function attention({attention: found, volumes, quotas}, sections) {
  const worries = found.filter(isWorry);
  if (!worries.length) {
    return volumes.length || quotas ? h('p', {class: 'calm'}, format.say('nothing')) : null;
  }
  return cutList(worries.map(entry => attentionLine(entry, sections)), MOST_WORRIES, 'attention');
}

// What the run found besides, for which there is nothing to do. Null without any.
export function glance({attention: found}, sections) {
  const calm = found.filter(entry => !isWorry(entry) && !isGain(entry));
  return calm.length ? cutList(calm.map(entry => attentionLine(entry, sections)), MOST_CALM, 'glance') : null;
}

const sumOf = (list, isMeant) => (list ?? []).filter(isMeant).reduce((sum, {bytes}) => sum + bytes, 0);
const OLD = 1095;  // days
const PASSING = ['temporary', 'log'].map(name => `reportUI_file_type_${name}`);

// What could give space back, the most first: the sums are the facts', each for itself, since a file
// may be in more than one.
export function next({duplicates, ages, types, volumes}, sections) {
  const [outside] = volumes.toSorted((one, two) => (two.outside ?? 0) - (one.outside ?? 0));
  const steps = [
    [duplicates?.reclaimable ?? 0, 'duplicate_file',
     duplicates?.mode === 'content' ? 'nextConfirmed' : 'nextPossible'],
    [sumOf(ages, ({age}) => ageOrder(age) >= OLD && ageOrder(age) < Infinity), 'file_age', 'nextOld'],
    [sumOf(types, ({type}) => PASSING.includes(type)), 'file_group', 'nextPassing'],
    [outside?.outside ?? 0, 'coverage', 'nextOutside', {name: outside && shown(outside.path)}]
  ].filter(([bytes]) => bytes > 0).sort(([one], [two]) => two - one);
  return steps.length ? h('ul', {class: 'steps'}, ...steps.map(([bytes, section, key, values]) => h(
    'li', {}, h('b', {}, sizeElement(bytes, null)), ' ',
    linkTo(section, sections, format.sayNodes(key, values ?? {}))))) : null;
}

// Where more of an incident's kind is to be seen, the first that the page has; others name their
// report.
const PLACES = {
  share_missing: ['coverage', 'share_list'], share_part: ['coverage', 'share_list'],
  share_overlap: ['coverage', 'share_list'], index_refused: ['coverage', 'share_list'],
  volume_unknown: ['volume_usage'], history_lost: ['volume_usage', 'growth'], quota_failed: ['quota_usage'],
  users_unknown: ['file_owner'], compare_stopped: ['duplicate_file']
};
const reportOf = ({kind, what}, sections) => Object.hasOwn(PLACES, kind) ?
  PLACES[kind].find(name => sections.has(name)) : sections.has(what) ? what : undefined;

function incidentLine(incident, sections) {
  const {level, kind, what, text} = incident;
  const report = reportOf(incident, sections);
  const detail = h('span', {lang: 'en'}, shown(text));
  if (!format.hasText('incidents', kind)) {
    return line(level, levelElement(level, false), detail);
  }
  const sentence = format.sayNodes(
    kind, {what: what === report ? format.nameOf('reports', report) : shown(what)}, 'incidents');
  return line(level, levelElement(level, false), linkTo(report, sections, sentence),
              h('p', {class: 'detail'}, detail));
}

// The list of incidents, errors first; the rest of a long one is folded. Null without any.
export function incidents({incidents: all}, sections) {
  if (!all.length) {
    return null;
  }
  const sorted = [...all.filter(({level}) => level === 'error'),
                  ...all.filter(({level}) => level !== 'error')];
  return cutList(sorted.map(incident => incidentLine(incident, sections)), MOST_INCIDENTS, 'incidents');
}

// The worst level of the incidents that concern each report.
export function marksOf(facts, sections) {
  const marks = new Map();
  for (const incident of facts?.incidents ?? []) {
    const report = reportOf(incident, sections);
    if (report && marks.get(report) !== 'error') {
      marks.set(report, incident.level);
    }
  }
  return marks;
}
