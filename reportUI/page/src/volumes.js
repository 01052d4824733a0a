// Volumes: the sign of a level, and their cards, with what fills them up.
import {sparkline} from './charts.js';
import {h, shown, shownPlain, svg} from './dom.js';
import * as format from './format.js';
import {basisTexts, outlookText} from './outlook.js';
import {addressOf} from './state.js';
import {barElement, sizeElement} from './table.js';

const MOST_LARGE = 2;  // cards that tell all of a volume
const DAYS_A_WEEK = 7;

const LEVEL_TEXTS = {ok: 'stateOk', warning: 'stateWarn', critical: 'stateCritical',
                     error: 'stateError'};
const CROSS = 'M4.5 1h5L13 4.5v5L9.5 13h-5L1 9.5v-5Z M7 3.8v4 M7 9.6v.8';
const LEVEL_SHAPES = {ok: 'M2 7.5 6 11.5 12.5 3', warning: 'M7 1.5 13 12.5H1Z M7 5.5V9 M7 10.6v.6',
                      critical: CROSS, error: CROSS};
const sign = (path, name) => svg('svg', {viewBox: '0 0 14 14', 'aria-hidden': 'true', class: name},
                                 svg('path', {d: path}));

// A sign for a level of a fact or an incident: its shape and its word.
export function levelElement(level, withWord = true) {
  return h('span', {class: `level ${level}`}, sign(LEVEL_SHAPES[level]),
           h('span', {class: withWord ? '' : 'unseen'}, format.say(LEVEL_TEXTS[level])));
}

// Used, of hundred; nothing of a volume whose size is unknown.
export const percentOf = ({size, percent}) => size ? percent : NaN;

function meter(volume) {
  const value = h('span', {class: 'value'});
  value.style.inlineSize = `${Math.max(0, Math.min(100, percentOf(volume) || 0))}%`;
  return h('span', {class: 'meter', 'aria-hidden': 'true'}, value);
}

// Of a volume whose size is unknown there is nothing to say but that.
const usage = ({size, used, free}) => size ? h('p', {class: 'usage'}, ...format.sayNodes(
  'usedOf', {used: sizeElement(used, null), total: sizeElement(size, null)}), ' · ',
  ...format.sayNodes('freeLeft', {size: sizeElement(free, null)})) : null;

const pace = ({forecast: {state, per_day: perDay}}) => perDay && state === 'growing' ?
  h('p', {class: 'pace'}, ...format.sayNodes('aWeek', {
    size: sizeElement(Math.round(perDay * DAYS_A_WEEK), null,
                      format.sizeChange(Math.round(perDay * DAYS_A_WEEK)))})) : null;

// The range, in brackets in every language, is said more quietly.
function outlook(volume, withLevel) {
  const [, words, blank, range] = /^(.*?\S)(\s*)([(（].*)?$/s.exec(outlookText(volume)) ?? [];
  return h('p', {class: 'outlook'}, withLevel && volume.size ? levelElement(volume.level) : null, ' ',
           h('span', {class: 'words'}, words, blank, range ? h('span', {class: 'range'}, range) : null));
}

const basis = volume => basisTexts(volume).map(text => h('p', {class: 'basis'}, text));

// --- Because of whom ----------------------------------------------------------------------------

const KINDS = {
  share: ['grownShare', 'M1.5 3h11v3h-11z M1.5 8h11v3h-11z M3.5 4.5h.1 M3.5 9.5h.1'],
  folder: ['grownFolder', 'M1.5 3h4l1.5 1.7h5.5V11.5h-11z'],
  folder_at_least: ['grownAtLeast', 'M1.5 3h4l1.5 1.7h5.5V11.5h-11z'],
  owner: ['grownOwner', 'M7 1.5a2.6 2.6 0 1 1 0 5.2 2.6 2.6 0 0 1 0-5.2Z M2 12.5c.4-3 2.3-4.3 5-4.3s4.6 1.3 5 4.3']
};

// Where more is to be seen of a cause: the folder in the drawing, or the owner's row.
function wayTo({kind, share, name}, volume, sections) {
  const section = kind === 'owner' ? 'file_owner' : 'folder_usage';
  return sections.has(section) ? addressOf(section, kind === 'owner' ? {file_owner: `!!${name}`} : {
    'folder_usage.place': [volume, share, ...kind === 'share' ? [] : name.split('/')].join('\n')}) : undefined;
}

function causeElement(cause, most, {text, volume, sections}) {
  const {kind, share, name, bytes} = cause;
  const [key, shape] = Object.hasOwn(KINDS, kind) ? KINDS[kind] : [kind, KINDS.folder[1]];
  const who = kind === 'share' ? share : kind === 'owner' ? name : `${share}/${name}`;
  const href = wayTo(cause, volume, sections);
  return h('li', {}, h('span', {class: 'kind', title: format.say(key)}, sign(shape),
                       h('span', {class: 'unseen'}, format.say(key))),
           barElement(bytes / most * 100, [h(href ? 'a' : 'span', {href}, shown(who)), ' ',
                                           sizeElement(bytes, null, text(bytes))]));
}

function causes(heading, list, way) {
  return list.length ? h('div', {class: 'causes'}, h('h4', {}, heading), h('ul', {}, ...list.map(
    cause => causeElement(cause, Math.max(...list.map(({bytes}) => bytes)), way)))) : null;
}

const because = ({path: volume, grown_by: grownBy, filled_by: filledBy}, sections) => [
  causes(format.say('grewSince', {date: format.day(grownBy?.[0]?.since)}), grownBy ?? [],
         {text: format.sizeChange, volume, sections}),
  causes(format.say('filledBy'), filledBy, {text: format.size, volume, sections})].filter(Boolean);

// In one line: the greatest of them.
function mainCause({grown_by: grownBy}) {
  const [first] = grownBy ?? [];
  return first ? h('p', {class: 'cause'}, ...format.sayNodes('mostly', {
    name: shown(first.kind === 'owner' ? first.name : first.share)})) : null;
}

// --- Cards --------------------------------------------------------------------------------------

const title = ({path}) => h('h3', {title: shownPlain(path)}, h('span', {class: 'long'}, shown(path)));
const share = volume => h('p', {class: 'percent'}, format.percent(percentOf(volume)));

function drawing(volume, now, width, height) {
  const {samples, size, forecast, level} = volume;
  return size ? sparkline(samples, {
    width, height, now, size, forecast, level, limit: forecast.state === 'growing'}) : null;
}

function largeCard(volume, now, sections) {
  return h('article', {class: `card large ${volume.level}`},
           h('div', {class: 'says'}, title(volume), outlook(volume, true), ...basis(volume)),
           h('div', {class: 'shape'}, drawing(volume, now, 400, 104)),
           h('div', {class: 'holds'}, share(volume), meter(volume), usage(volume), pace(volume)),
           ...because(volume, sections));
}

function smallCard(volume, now) {
  return h('article', {class: `card ${volume.level}`},
           title(volume), share(volume), drawing(volume, now, 240, 36), outlook(volume, volume.level !== 'ok'),
           meter(volume), ...basis(volume), usage(volume),
           h('div', {class: 'line'}, pace(volume), mainCause(volume)));
}

// The most pressing first, and these at length. `sections`: names of those that the page has.
export function cards(volumes, now, sections) {
  const pressing = volumes.filter(({level}) => level !== 'ok').length;
  const large = Math.max(1, Math.min(MOST_LARGE, pressing));
  return h('div', {class: 'cards'}, ...volumes.map(
    (volume, i) => i < large ? largeCard(volume, now, sections) : smallCard(volume, now)));
}
