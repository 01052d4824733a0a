// What a reader chooses for all pages, and is remembered: language and colours.
import {h} from './dom.js';
import * as format from './format.js';

const THEMES = {system: 'themeSystem', light: 'themeLight', dark: 'themeDark'};

function choice(label, options, chosen, change) {
  const select = h('select', {}, ...options.map(([value, text]) => h(
    'option', {value, selected: value === chosen}, text)));
  select.addEventListener('change', () => change(select.value));
  return h('label', {}, h('span', {}, label), select);
}

const remember = {
  get: key => { try { return localStorage.getItem(`vorn-${key}`); } catch { return null; } },
  set: (key, value) => { try { localStorage.setItem(`vorn-${key}`, value); } catch { /* not kept then */ } }
};

function setTheme(theme) {
  document.documentElement.dataset.theme = theme in THEMES ? theme : 'system';
}

export const languageChoice = translate => choice(
  format.say('language'), format.languages(), format.currentLanguage(), code => {
    format.chooseLanguage(code);
    remember.set('language', code);
    translate();
  });

export const themeChoice = () => choice(
  format.say('theme'), Object.entries(THEMES).map(([theme, key]) => [theme, format.say(key)]),
  document.documentElement.dataset.theme, theme => {
    setTheme(theme);
    remember.set('theme', theme);
  });

// `language`: of the page, unless the reader has chosen another.
export function useRemembered(language) {
  format.chooseLanguage(remember.get('language') ?? language ?? 'en');
  setTheme(remember.get('theme') ?? 'system');
}
