// Builds the page from the data blocks that stand in it. See data.js for what those are.
import {copyOriginals, h, shown, shownPlain} from './dom.js';
import {forgetDrawings} from './charts.js';
import {languageChoice, themeChoice, useRemembered} from './choices.js';
import {hasBlock, piecesOf, readReport, readVariable} from './data.js';
import {readFacts} from './facts.js';
import * as format from './format.js';
import {unfold} from './folds.js';
import {fillSection, REPORTS} from './sections.js';
import {anchorOf, begin, followAnchor, keep, stateOf} from './state.js';
import {attention, glance, incidents, marksOf, next} from './summary.js';
import {forgetTables, foundIn, isSought, seek, showAllRows, showFewRows} from './table.js';
import {cards, levelElement} from './volumes.js';

const MOST_BESIDE = 6;  // cards of volumes that stand beside what needs attention
const SERIES_COLUMNS = 2;  // time and value
const main = document.querySelector('main');
const header = document.querySelector('header');
const blocks = document.getElementById('data').content;
const pieces = piecesOf(blocks);
const written = new Map([...main.querySelectorAll('section[data-report]')].map(
  section => [section.dataset.report, section]));

// Each block is read when its section is filled.
const data = new Map();
function read(name) {
  if (!data.has(name) && written.has(name) && REPORTS[name]) {
    const {variable, columns, mode, series} = REPORTS[name];
    const report = readReport(pieces, variable, columns);
    if (report) {
      report.before = series && readReport(pieces, series, SERIES_COLUMNS)?.tables;
      report.mode = mode && readVariable(pieces, mode);
      report.heading = name + (report.mode ?? '');
    }
    data.set(name, report);
  }
  return data.get(name);
}
const has = name => written.has(name) && hasBlock(pieces, REPORTS[name].variable);
const others = {has, shareRows: () => [...read('share_list')?.tables.values() ?? []].flat()};
const facts = readFacts(pieces);
const marks = marksOf(facts, written);
// What the frame says serves only where the facts are missing.
const host = facts?.host || main.dataset.host;
const profile = facts?.profile || main.dataset.profile;
const made = facts?.finished || main.dataset.time;

// Which of the reports without a block have just found nothing: the head knows their number.
function emptyReports() {
  const without = [...written.keys()].filter(
    name => REPORTS[name] && !REPORTS[name].always && !has(name)).length;
  const {empty} = document.body.dataset;
  return Number(empty) >= without ? 'all' : Number(empty) === 0 ? 'none' : 'some';
}

// --- Header -------------------------------------------------------------------------------------

// Opens all that is folded in `part`, and what was folded in that.
function unfoldAll(part) {
  const opened = [];
  for (let each; (each = part.querySelector('details:not([open])'));) {
    unfold(each);
    opened.push(each);
  }
  return () => opened.forEach(each => { each.open = false; });
}

// Looks for what the reader has asked for in all tables, folded ones too: sections without a find step
// aside, and so do their links.
const foldAgain = [];
function search() {
  const text = stateOf('find');
  if (text) {
    written.forEach(section => foldAgain.push(unfoldAll(section)));
  } else {
    foldAgain.splice(0).forEach(fold => fold());
  }
  seek(text);
  main.classList.toggle('searched', isSought());
  let all = 0;
  for (const link of main.querySelectorAll('nav a')) {
    const section = written.get(link.hash.slice(1));
    const found = isSought() && section ? foundIn(section) : 0;
    all += found;
    link.hidden = isSought() && !found;
    link.querySelector('.hits').textContent = found ? format.number(found) : '';
    if (section) {
      section.hidden = link.hidden;
    }
  }
  header.querySelector('.hits').textContent = isSought() ? format.say('found', {n: format.number(all)}) : '';
}

function searchBox() {
  const input = h('input', {type: 'search', value: stateOf('find'), placeholder: format.say('search'),
                            'aria-label': format.say('search')});
  let waiting;
  input.addEventListener('input', () => {
    keep('find', input.value.trim());
    clearTimeout(waiting);
    waiting = setTimeout(search, 150);
  });
  return h('span', {class: 'search'}, input, h('span', {class: 'hits', role: 'status'}));
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
      searchBox(),
      languageChoice(translate),
      themeChoice(),
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
  const {volumes, finished} = facts;
  return [part('incidents', format.say(facts.complete ? 'incidents' : 'incomplete'),
               incidents(facts, written)),
          h('div', {class: volumes.length > MOST_BESIDE ? 'first many' : 'first'},
            part('attention', format.say('attention'), attention(facts, written)),
            part('volumes', format.say('volumes'), volumes.length ? cards(volumes, finished, written) : null),
            part('next', format.say('next'), next(facts, written)),
            part('glance', format.say('glance'), glance(facts, written)))];
}

function navigation(names) {
  const links = names.map(name => h(
    'a', {href: `#${name}`}, format.nameOf('nav', name), marks.has(name) ?
      levelElement(marks.get(name), false) : null, h('span', {class: 'hits'})));
  const all = [...facts?.incidents.length ? [h('a', {href: '#incidents', class: 'marked'}, format.nameOf(
    'nav', 'incidents'), levelElement(facts.complete ? 'warning' : 'error', false), h('span', {class: 'hits'}))] :
    [], ...links];
  return h('nav', {'aria-label': format.say('sections')}, ...all);
}

// Marks where the reader is.
let seen;
function watchPlaces() {
  seen?.disconnect();
  const inView = new Set();
  const links = new Map([...main.querySelectorAll('nav a')].map(link => [link.hash.slice(1), link]));
  seen = new IntersectionObserver(entries => {
    entries.forEach(({target, isIntersecting}) => inView[isIntersecting ? 'add' : 'delete'](target.id));
    const here = [...links.keys()].find(id => inView.has(id));
    links.forEach((link, id) => id === here ? link.setAttribute('aria-current', 'true') :
      link.removeAttribute('aria-current'));
    const link = links.get(here);
    link?.parentElement.scrollTo({left: link.offsetLeft - link.parentElement.clientWidth / 2});
  }, {rootMargin: '-15% 0px -70% 0px'});
  main.querySelectorAll('section').forEach(section => seen.observe(section));
}

// A section that can't be drawn takes none of the others along.
function fillOrSay(name, about) {
  try {
    fillSection(written.get(name), name, about);
  } catch (error) {
    console.error(error);
    written.get(name).append(h('p', {class: 'note'}, format.say('unknown')));
  }
}

const pause = () => new Promise(resolve => setTimeout(resolve));
let turn = 0;

// The first look at once, then a section in a task of its own, so that the page answers meanwhile.
// Whether it came to its end: the page may be made anew meanwhile.
async function render() {
  const mine = ++turn;
  document.documentElement.lang = format.currentLanguage();
  document.title = `${format.say('title')} – ${shownPlain(host)}`;
  document.querySelector('.skip').textContent = format.say('skip');
  document.body.removeAttribute('data-ready');
  forgetTables();
  forgetDrawings();
  fillHeader();
  const names = [...Object.keys(REPORTS).filter(name => written.has(name)),
                 ...[...written.keys()].filter(name => !REPORTS[name])];
  for (const name of names) {
    const section = written.get(name);
    section.id = name;
    section.setAttribute('aria-labelledby', `${name}-heading`);
  }
  const everything = h('button', {type: 'button', class: 'everything'}, format.say('printAll'));
  everything.addEventListener('click', printAll);
  main.replaceChildren(
    navigation(names), ...firstLook().filter(Boolean), ...names.map(name => written.get(name)),
    h('footer', {}, h('p', {}, format.say('units', {zone: format.currentZone()})), everything));
  const empty = emptyReports();
  for (const name of names) {
    await pause();
    if (mine !== turn) {
      return false;
    }
    fillOrSay(name, {data: read(name), facts, emptyReports: empty, mark: marks.get(name), others});
  }
  watchPlaces();
  if (stateOf('find') || isSought()) {
    search();
  }
  document.body.dataset.ready = '';
  return true;
}

// Where the reader is to be when the page is made: at `place`, or else where the address leads.
let place;
function goToPlace() {
  const target = document.getElementById(place ? place.id : anchorOf());
  if (place) {
    window.scrollTo({top: target ? window.scrollY + target.getBoundingClientRect().top - place.top : place.scrollY,
                     behavior: 'instant'});
  } else {
    target?.scrollIntoView();
  }
}

async function renderInPlace() {
  main.style.minBlockSize = `${main.offsetHeight}px`;
  if (await render()) {
    main.style.minBlockSize = '';
    goToPlace();
    place = undefined;
  }
}

// Another language, with the page where it is. One that is chosen while the page is still being made
// finds it where it was before that.
function translate() {
  if ('ready' in document.body.dataset) {
    const here = [...main.querySelectorAll('section')].find(each => each.getBoundingClientRect().bottom > 0);
    place = {id: here?.id, top: here?.getBoundingClientRect().top, scrollY: window.scrollY};
  }
  renderInPlace();
  header.querySelector('select').focus({preventScroll: true});
}

// A print holds what is shown; this one all there is.
function printAll() {
  const foldAll = unfoldAll(main);
  showAllRows();
  window.addEventListener('afterprint', () => {
    foldAll();
    showFewRows();
  }, {once: true});
  window.print();
}

format.loadDictionaries(document);
useRemembered(readVariable(pieces, 'vornLang'));
format.chooseZone(facts?.time_zone || main.dataset.zone);
format.callVolumes(facts?.volumes ?? []);
document.addEventListener('copy', copyOriginals);
document.addEventListener('click', ({target}) => target.closest('.long')?.classList.toggle('open'));
begin();
// Now the reader is where the address leads, also while the page is still being made.
window.addEventListener('hashchange', () => {
  place = undefined;
  followAnchor() ? renderInPlace() : goToPlace();
});
renderInPlace();
