// Builds the page from the data blocks that stand in it. See data.js for what those are.
import {copyOriginals, h, shown, shownPlain} from './dom.js';
import {piecesOf, readReport, readVariable} from './data.js';
import {readFacts} from './facts.js';
import * as format from './format.js';
import {fillSection, REPORTS} from './sections.js';
import {attention, incidents, marksOf} from './summary.js';
import {card, levelElement} from './volumes.js';

const THEMES = {system: 'themeSystem', light: 'themeLight', dark: 'themeDark'};
const MOST_BESIDE = 8;  // cards of volumes beside what needs attention
const main = document.querySelector('main');
const header = document.querySelector('header');
const blocks = document.getElementById('data').content;
const pieces = piecesOf(blocks);
const written = new Map([...main.querySelectorAll('section[data-report]')].map(
  section => [section.dataset.report, section]));

function read() {
  const data = new Map();
  for (const [name, {variable, columns, mode}] of Object.entries(REPORTS)) {
    const report = written.has(name) && readReport(pieces, variable, columns);
    if (report) {
      report.mode = mode && readVariable(pieces, mode);
      report.heading = name + (report.mode ?? '');
      data.set(name, report);
    }
  }
  return data;
}
const data = read();
const facts = readFacts(pieces);
const marks = marksOf(facts, written);
// What the frame says serves only where the facts are missing.
const host = facts?.host || main.dataset.host;
const profile = facts?.profile || main.dataset.profile;
const made = facts?.finished || main.dataset.time;

// Which of the reports without a block have just found nothing: the head knows their number.
function emptyReports() {
  const without = [...written.keys()].filter(
    name => !data.has(name) && REPORTS[name] && !REPORTS[name].always).length;
  const {empty} = document.body.dataset;
  return Number(empty) >= without ? 'all' : Number(empty) === 0 ? 'none' : 'some';
}

// --- Header -------------------------------------------------------------------------------------

function choice(label, options, chosen, change) {
  const select = h('select', {}, ...options.map(([value, text]) => h(
    'option', {value, selected: value === chosen}, text)));
  select.addEventListener('change', () => change(select.value));
  return h('label', {}, h('span', {}, label), select);
}

const remember = {
  get: () => { try { return localStorage.getItem('vorn-theme'); } catch { return null; } },
  set: theme => { try { localStorage.setItem('vorn-theme', theme); } catch { /* not kept then */ } }
};

function setTheme(theme) {
  document.documentElement.dataset.theme = theme in THEMES ? theme : 'system';
}

function fillHeader() {
  const print = h('button', {type: 'button'}, format.say('print'));
  print.addEventListener('click', () => window.print());
  header.replaceChildren(
    h('div', {},
      h('h1', {}, format.say('title'), ' ', h('span', {class: 'host'}, shown(host))),
      h('p', {},
        ...profile ? [format.say('profile'), ' ', h('b', {}, shown(profile)), ' · '] : [],
        h('time', {datetime: format.isoTime(made)}, format.time(made)), ' ',
        h('span', {class: 'zone'}, format.zoneName(made)))),
    h('div', {class: 'controls'},
      choice(format.say('language'), format.languages(), format.currentLanguage(), code => {
        format.chooseLanguage(code);
        render();
        header.querySelector('select').focus();
      }),
      choice(format.say('theme'), Object.entries(THEMES).map(
        ([theme, key]) => [theme, format.say(key)]), document.documentElement.dataset.theme,
             theme => { setTheme(theme); remember.set(theme); }),
      print));
}

// --- Body ---------------------------------------------------------------------------------------

function part(id, heading, content) {
  return content && h('section', {id, 'aria-labelledby': `${id}-heading`},
                      h('h2', {id: `${id}-heading`}, heading), content);
}

function firstLook() {
  if (!facts) {
    return [h('section', {id: 'no-facts'}, h('p', {}, levelElement('warning'), ' ',
                                             format.say('noFacts')))];
  }
  const {volumes} = facts;
  const cards = part('volumes', format.say('volumes'), volumes.length ?
    h('div', {class: 'cards'}, ...volumes.map(card)) : null);
  const notices = part('attention', format.say('attention'), attention(facts, written));
  // Many cards take the whole width, and would push the rest out of sight.
  const many = volumes.length > MOST_BESIDE;
  return [part('incidents', format.say(facts.complete ? 'incidents' : 'incomplete'),
               incidents(facts, written)),
          cards || notices ? h('div', {class: many ? 'first many' : 'first'},
                               ...many ? [notices, cards] : [cards, notices]) : null];
}

function navigation(names) {
  return h('nav', {'aria-label': format.say('sections')}, ...names.map(name => h(
    'a', {href: `#${name}`}, name === 'volume_usage' ? format.say('history') :
      format.nameOf('reports', name), marks.has(name) ? levelElement(marks.get(name), false) :
      null)));
}

function render() {
  document.documentElement.lang = format.currentLanguage();
  document.title = `${format.say('title')} – ${shownPlain(host)}`;
  document.querySelector('.skip').textContent = format.say('skip');
  fillHeader();
  const names = [...Object.keys(REPORTS).filter(name => written.has(name)),
                 ...[...written.keys()].filter(name => !REPORTS[name])];
  const empty = emptyReports();
  for (const name of names) {
    const section = written.get(name);
    section.id = name;
    section.setAttribute('aria-labelledby', `${name}-heading`);
    fillSection(section, name, {data: data.get(name), facts, emptyReports: empty,
                                mark: marks.get(name)});
  }
  main.replaceChildren(
    navigation(names), ...firstLook().filter(Boolean), ...names.map(name => written.get(name)),
    h('footer', {}, h('p', {}, format.say('units', {zone: format.currentZone()}))));
  // Where the drawing is wider than the screen, the time to come is what matters.
  main.querySelector('.history')?.parentElement.scrollTo({left: 1e6});
}

format.loadDictionaries(document);
format.chooseLanguage(readVariable(pieces, 'vornLang') ?? 'en');
format.chooseZone(facts?.time_zone || main.dataset.zone);
format.callVolumes(facts?.volumes ?? []);
// The same colours everywhere, and for the most pressing ones those that differ the most.
facts?.volumes.forEach(({id}) => format.seriesOf(id));
setTheme(remember.get() ?? 'system');
document.addEventListener('copy', copyOriginals);
render();
if (location.hash) {
  document.getElementById(decodeURIComponent(location.hash.slice(1)))?.scrollIntoView();
}
