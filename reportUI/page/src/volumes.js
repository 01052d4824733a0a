// Volumes: the sign of a level, and the card.
import {arc} from 'd3-shape';

import {h, shown, shownPlain, svg} from './dom.js';
import * as format from './format.js';
import {basisTexts, outlookText} from './outlook.js';
import {sizeElement} from './table.js';

const LEVEL_TEXTS = {ok: 'stateOk', warning: 'stateWarn', critical: 'stateCritical',
                     error: 'stateError'};
const CROSS = 'M4.5 1h5L13 4.5v5L9.5 13h-5L1 9.5v-5Z M7 3.8v4 M7 9.6v.8';
const LEVEL_SHAPES = {ok: 'M2 7.5 6 11.5 12.5 3', warning: 'M7 1.5 13 12.5H1Z M7 5.5V9 M7 10.6v.6',
                      critical: CROSS, error: CROSS};

// A sign for a level of a fact or an incident: its shape and its word.
export function levelElement(level, withWord = true) {
  return h('span', {class: `level ${level}`},
           svg('svg', {viewBox: '0 0 14 14', 'aria-hidden': 'true'},
               svg('path', {d: LEVEL_SHAPES[level]})),
           h('span', {class: withWord ? '' : 'unseen'}, format.say(LEVEL_TEXTS[level])));
}

// Used, of hundred; nothing of a volume whose size is unknown.
export const percentOf = ({size, percent}) => size ? percent : NaN;

function gauge(volume) {
  const percent = percentOf(volume);
  const share = Math.max(0, Math.min(1, (percent || 0) / 100));
  const piece = arc().innerRadius(33).outerRadius(44).startAngle(-2.2);
  return svg('svg', {class: `gauge ${volume.level}`, viewBox: '-46 -46 92 76', 'aria-hidden': 'true'},
             svg('path', {class: 'track', d: piece.endAngle(2.2)()}),
             svg('path', {class: 'value', d: piece.endAngle(-2.2 + 4.4 * share)()}),
             svg('text', {y: 6}, format.percent(percent)));
}

// Of a volume whose size is unknown there is nothing to say but that.
function usageLines({size, used, free}) {
  return size ? [
    h('p', {}, ...format.sayNodes('usedOf', {used: sizeElement(used), total: sizeElement(size)})),
    h('p', {}, ...format.sayNodes('freeLeft', {size: sizeElement(free)}))] : [];
}

export function card(volume) {
  const {path, level, size} = volume;
  return h('article', {class: `card ${level}`},
           gauge(volume),
           h('div', {},
             h('h3', {title: shownPlain(path)}, shown(path)),
             h('p', {class: 'unseen'}, format.percent(percentOf(volume))),
             h('p', {class: 'outlook'}, size || level !== 'ok' ? levelElement(level) : null, ' ',
               h('span', {class: 'words'}, outlookText(volume))),
             ...basisTexts(volume).map(text => h('p', {class: 'basis'}, text)),
             ...usageLines(volume)));
}
