// The first look: what fills up, when, and because of whom.
import {h, shown} from './dom.js';
import * as format from './format.js';
import {groupsOf, isCut, REPORTS} from './sections.js';
import {sizeElement} from './table.js';
import {stateElement} from './volumes.js';

const MOST_VOLUMES = 3, MOST_USERS = 3;
const OVER = 100, NEAR = 90;

const rowsOf = data => data ? [...data.tables.values()].flat() : [];

function volumeNotices(volumes) {
  const pressing = volumes.filter(({state}) => state !== 'ok');
  const order = ['critical', 'warn'];
  pressing.sort((one, two) => order.indexOf(one.state) - order.indexOf(two.state) ||
    one.outlook.order - two.outlook.order || two.percent - one.percent);
  return (pressing.length ? pressing.slice(0, MOST_VOLUMES) : volumes.slice(0, 1)).map(volume => ({
    to: 'volume_usage', state: volume.state, key: 'noticeVolume',
    values: {name: shown(volume.name), percent: format.percent(volume.percent),
             outlook: volume.outlook.text}}));
}

function quotaNotices(data) {
  const users = [...data?.tables ?? []].flatMap(([volume, rows]) => rows.map(
    ([user, quota, used]) => ({volume, user, quota, used,
                               percent: Number(used) / Number(quota) * 100})))
    .filter(({quota, percent}) => Number(quota) > 0 && percent >= NEAR)
    .sort((one, two) => two.percent - one.percent);
  const notices = users.slice(0, MOST_USERS).map(user => ({
    to: 'quota_usage', state: user.percent > OVER ? 'critical' : 'warn',
    key: user.percent > OVER ? 'noticeOverQuota' : 'noticeNearQuota',
    values: {user: shown(user.user), volume: shown(user.volume), used: sizeElement(user.used, null),
             quota: sizeElement(user.quota, null), percent: format.percent(user.percent)}}));
  if (users.length > MOST_USERS) {
    notices.push({to: 'quota_usage', state: 'warn', key: 'noticeMoreUsers',
                  values: {n: format.number(users.length - MOST_USERS)}});
  }
  return notices;
}

function greatest(sums) {
  let best;
  for (const [name, bytes] of sums) {
    if (!best || bytes > best[1]) {
      best = [name, bytes];
    }
  }
  return best && best[1] > 0 ? best : null;
}

function shareNotices(data) {
  const best = greatest(rowsOf(data).map(([share, , bytes]) => [share, Number(bytes)]));
  return best ? [{to: 'share_list', key: 'noticeShare',
                  values: {share: shown(best[0]), size: sizeElement(best[1], null)}}] : [];
}

function ownerNotices(data) {
  const sums = new Map();
  for (const [owner, , , bytes] of rowsOf(data)) {
    sums.set(owner, (sums.get(owner) ?? 0) + (Number(bytes) || 0));
  }
  const best = greatest(sums);
  return best ? [{to: 'file_owner', key: 'noticeOwner',
                  values: {owner: shown(best[0]), size: sizeElement(best[1], null)}}] : [];
}

function duplicateNotices(data) {
  const frees = groupsOf(rowsOf(data)).reduce((sum, group) => sum + group.frees, 0n);
  if (frees === 0n) {
    return [];
  }
  const kind = data.mode === '1' ? 'noticeConfirmed' : 'noticePossible';
  return [{to: 'duplicate_file',
           key: isCut(REPORTS.duplicate_file, data) || !data.whole ? `${kind}More` : kind,
           values: {size: sizeElement(frees, null)}}];
}

function oldestNotices(data) {
  const [first] = rowsOf(data);
  return first && Number(first[3]) > 0 ? [{
    to: 'least_modify', key: 'noticeOldest',
    values: {date: format.day(first[3]),
             file: shown(first[1].slice(first[1].lastIndexOf('/') + 1))}}] : [];
}

function line({to, state = 'info', key, values}) {
  return h('li', {class: state},
           state === 'info' ? h('span', {class: 'state info', 'aria-hidden': 'true'}, '›') :
             stateElement(state, false),
           h('a', {href: `#${to}`}, ...format.sayNodes(key, values)));
}

const rank = ({state = 'info'}) => ['critical', 'warn'].indexOf(state) + 1 || 3;

// The list of what needs attention, the worst first, each line with a link to its section. `data`: report name to
// what was read. Null where no report looks for what may need some.
export function attention(data, volumes) {
  const notices = [
    ...volumeNotices(volumes), ...quotaNotices(data.get('quota_usage')),
    ...shareNotices(data.get('share_list')), ...ownerNotices(data.get('file_owner')),
    ...duplicateNotices(data.get('duplicate_file')), ...oldestNotices(data.get('least_modify'))];
  notices.sort((one, two) => rank(one) - rank(two));
  return notices.length ? h('ul', {class: 'notices'}, ...notices.map(line)) :
    data.has('volume_usage') || data.has('quota_usage') ? h('p', {}, format.say('nothing')) : null;
}
