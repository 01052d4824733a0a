// Elements, and texts that come from anybody who may write into a share.

const SVG = 'http://www.w3.org/2000/svg';
// Controls, formats (bidirectional and zero-width ones), line separators, unusual blanks, fillers,
// and lone surrogates.
const INVISIBLE =
  /([\p{Cc}\p{Cf}\p{Zl}\p{Zp}\p{Cs}\p{Co}\u00a0\u00ad\u034f\u115f\u1160\u2000-\u200a\u202f\u205f\u2800\u3000\u3164\ufe00-\ufe0f\uffa0\u{e0100}-\u{e01ef}])/u;
const BYTE = /[\udc80-\udcff]/;

function fill(element, attributes, children) {
  for (const [name, value] of Object.entries(attributes)) {
    if (value === true) {
      element.setAttribute(name, '');
    } else if (value !== undefined && value !== null && value !== false) {
      element.setAttribute(name, value);
    }
  }
  element.append(...children.filter(child => child !== null && child !== undefined));
  return element;
}

export function h(tag, attributes = {}, ...children) {
  return fill(document.createElement(tag), attributes, children);
}

export function svg(tag, attributes = {}, ...children) {
  return fill(document.createElementNS(SVG, tag), attributes, children);
}

// A byte that is no UTF-8 arrives as a lone low surrogate that carries it.
export function codeName(character) {
  const code = character.codePointAt(0);
  return BYTE.test(character) ? `\\x${(code - 0xdc00).toString(16)}` :
    `U+${code.toString(16).toUpperCase().padStart(4, '0')}`;
}

// `text` as it is, with what can't be seen as chips that say its code.
export function shown(text) {
  return h('bdi', {}, ...text.split(INVISIBLE).map((piece, index) =>
    index % 2 ? h('span', {class: 'chip', 'data-original': piece}, codeName(piece)) : piece));
}

// `text` in one line for an attribute or a drawing, where no chip can stand.
export function shownPlain(text) {
  return text.split(INVISIBLE).map((piece, index) =>
    index % 2 ? `[${codeName(piece)}]` : piece).join('');
}

// What stands for `text` on the clipboard: itself, or, with bytes that no text can hold, a word
// that bash and zsh read as those bytes.
export function copyable(text) {
  if (!/\p{Cs}/u.test(text)) {
    return text;
  }
  return `$'${text.replace(/[\\']/g, '\\$&').replace(/\n/g, '\\n').replace(
    /\p{Cs}/gu, codeName)}'`;
}

// The address of a file or folder, bytes that are no UTF-8 included.
export const fileAddress = path => `file://${path.split(/(\p{Cs})/u).map((piece, index) =>
  index % 2 === 0 ? encodeURIComponent(piece).replaceAll('%2F', '/') :
    BYTE.test(piece) ? `%${(piece.charCodeAt(0) - 0xdc00).toString(16)}` : '%EF%BF%BD').join('')}`;

export async function copyText(text) {
  try {
    await navigator.clipboard.writeText(text);
    return true;
  } catch {  // over http:// there is no such clipboard
    const area = h('textarea', {class: 'unseen', 'aria-hidden': 'true'});
    area.value = text;
    document.body.append(area);
    area.select();
    const done = document.execCommand('copy');
    area.remove();
    return done;
  }
}

// Copies of a selection hold what chips stand for.
export function copyOriginals(event) {
  const selection = document.getSelection();
  if (!selection.rangeCount || selection.isCollapsed) {
    return;
  }
  const part = selection.getRangeAt(0).cloneContents();
  const chips = part.querySelectorAll('.chip');
  if (!chips.length) {
    return;
  }
  chips.forEach(chip => chip.replaceWith(chip.dataset.original));
  part.querySelectorAll('button').forEach(button => button.remove());
  const rows = [...part.querySelectorAll('tr')];
  const text = rows.length ? rows.map(row => [...row.children].map(
    cell => cell.textContent).join('\t')).join('\n') : part.textContent;
  event.clipboardData.setData('text/plain', text);
  event.preventDefault();
}
