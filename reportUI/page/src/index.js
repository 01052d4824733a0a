// The list of a profile's reports, with the volumes over all of them. It stands beside their folders.
import {languageChoice, themeChoice, useRemembered} from './choices.js';
import {forgetDrawings} from './charts.js';
import {copyOriginals, h, shown, shownPlain} from './dom.js';
import {readReports} from './facts.js';
import * as format from './format.js';
import {history} from './history.js';
import {begin} from './state.js';
import {forgetTables, table} from './table.js';
import {levelElement} from './volumes.js';

const main = document.querySelector('main');
const {host, profile, reports, volumes, ...data} = readReports(
  JSON.parse(document.getElementById('data').textContent));

const COLUMNS = [['time', 'element'], ['level', 'element'], ['used', 'size'], ['grown', 'change']];

const linkTo = ({name, made}) => h('a', {href: `${encodeURIComponent(name)}/report.html`},
                                   made ? format.time(made) : name);

function stateOf({level, complete}) {
  return !level ? format.UNKNOWN : h('span', {}, levelElement(level), complete ? '' :
    h('span', {class: 'soft'}, ` ${format.say('incomplete')}`));
}

const ORDER = ['ok', 'warning', 'critical'];
const rowOf = report => [
  {order: report.made, make: () => linkTo(report)},
  {order: ORDER.indexOf(report.level), make: () => stateOf(report)},
  String(report.used ?? ''), String(report.grown ?? '')];

const section = (id, heading, ...content) => h('section', {id, 'aria-labelledby': `${id}-heading`},
  h('h2', {id: `${id}-heading`}, heading), ...content);

function render() {
  document.documentElement.lang = format.currentLanguage();
  document.title = `${format.say('allReports')} – ${profile} – ${shownPlain(host)}`;
  forgetTables();
  forgetDrawings();
  document.querySelector('header').replaceChildren(
    h('div', {}, h('h1', {}, format.say('allReports'), ' ', h('span', {class: 'host'}, shown(host))),
      h('p', {}, format.say('profile'), ' ', h('b', {}, shown(profile)))),
    h('div', {class: 'controls'}, languageChoice(translate), themeChoice()));
  const newest = reports.at(-1)?.made ?? 0;
  main.replaceChildren(
    ...volumes.length ? [section('volume_usage', format.say('history'), ...history(volumes, newest))] : [],
    section('reports', format.say('allReports'), reports.length ? table(
      COLUMNS, reports.map(rowOf).reverse(), {key: 'reports.all', caption: format.say('allReports')}) :
      h('p', {class: 'note'}, format.say('noRows'))),
    h('footer', {}, h('p', {}, format.say('units', {zone: format.currentZone()}))));
  document.body.dataset.ready = '';
}

function translate() {
  const {scrollY} = window;
  render();
  document.querySelector('header select').focus({preventScroll: true});
  window.scrollTo({top: scrollY, behavior: 'instant'});
}

format.loadDictionaries(document);
useRemembered(data.language || undefined);
format.chooseZone(data.time_zone);
document.addEventListener('copy', copyOriginals);
begin();
render();
