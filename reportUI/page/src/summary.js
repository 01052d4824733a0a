// The first look: what the run has found that needs attention, and what went wrong with it. The
// facts say both by codes, the dictionaries in words.
import {attention as FORMATS} from 'report_format';

import {h, shown} from './dom.js';
import * as format from './format.js';
import {fillsText} from './outlook.js';
import {sizeElement} from './table.js';
import {levelElement} from './volumes.js';

const MOST_INCIDENTS = 8;  // that stand open

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
  return line(level, level === 'ok' ? h('span', {class: 'level', 'aria-hidden': 'true'}, '›') :
    levelElement(level, false),
              linkTo(section, sections, format.sayNodes(code, valuesOf(entry), 'attention')));
}

// What needs attention, each line with a link to its section. `sections`: names of those that the
// page has. Null when the run has looked at nothing that may need some.
export function attention({attention: found, volumes, quotas}, sections) {
  const isCalm = found.every(({level}) => level === 'ok') && (volumes.length || quotas);
  const content = [
    isCalm ? h('p', {}, format.say('nothing')) : null,
    found.length ? h('ul', {class: 'notices'}, ...found.map(
      entry => attentionLine(entry, sections))) : null].filter(Boolean);
  return content.length ? h('div', {}, ...content) : null;
}

// The report that an incident concerns, if any: a share may be called like one.
function reportOf({kind, what}, sections) {
  return sections.has(what) && !/^(share|index)_/.test(kind) ? what : undefined;
}

function incidentLine(incident, sections) {
  const {level, kind, what, text} = incident;
  const report = reportOf(incident, sections);
  const detail = h('span', {lang: 'en'}, shown(text));
  if (!format.hasText('incidents', kind)) {
    return line(level, levelElement(level, false), detail);
  }
  const sentence = format.sayNodes(
    kind, {what: report ? format.nameOf('reports', report) : shown(what)}, 'incidents');
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
  const list = part => h('ul', {class: 'notices'}, ...part.map(
    incident => incidentLine(incident, sections)));
  return h('div', {}, list(sorted.slice(0, MOST_INCIDENTS)), sorted.length > MOST_INCIDENTS ?
    h('details', {},
      h('summary', {}, format.say('showAll', {n: format.number(sorted.length)})),
      list(sorted.slice(MOST_INCIDENTS))) : null);
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
