// What is folded: made when it is opened, and still open after a change of the language.
import {h} from './dom.js';
import {hasState} from './state.js';

const opened = new Set();  // keys of what a reader has opened
const makers = new WeakMap();

// Also open is what an address leads into.
export const isOpened = key => opened.has(key) || hasState(key);
export const noteOpened = (key, isOpen) => { opened[isOpen ? 'add' : 'delete'](key); };

function make(details) {
  const content = makers.get(details);
  makers.delete(details);
  details.append(...content ? [content()] : []);
}

export function unfold(details) {
  make(details);
  details.open = true;
}

// `content`: what is folded, an element or what makes it; `key`: of its state.
export function fold(key, summary, content) {
  const head = h('summary', {}, summary);
  const details = h('details', {}, head);
  typeof content === 'function' ? makers.set(details, content) : details.append(content);
  head.addEventListener('click', () => {
    make(details);
    noteOpened(key, !details.open);
  });
  details.addEventListener('toggle', () => make(details), {once: true});  // a browser's search opens, too
  if (isOpened(key)) {
    unfold(details);
  }
  return details;
}
