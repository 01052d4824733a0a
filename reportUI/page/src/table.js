// Tables: sorted, filtered, cut to their first rows, with the CSV file and the paths to copy.
import {copyText, copyable, h, shown, shownPlain, svg} from './dom.js';
import * as format from './format.js';

const FIRST_ROWS = 10;
const FILTER_FROM = 6;  // fewer rows are taken in at a glance

// `text` is what is shown and filtered by, `exact` the number of bytes.
export function sizeElement(bytes, tabindex = 0) {
  if (!format.isNumber(String(bytes))) {
    return h('span', {}, format.UNKNOWN);
  }
  const exact = format.exactSize(bytes);
  return h('span', {class: 'bytes', tabindex, title: exact, 'data-exact': exact},
           format.size(bytes));
}

function changeElement(bytes) {
  const exact = format.isSigned(bytes) ? format.exactSize(bytes) : undefined;
  return exact === undefined ? h('span', {}, format.UNKNOWN) :
    h('span', {class: 'bytes', tabindex: -1, title: exact, 'data-exact': exact},
      format.sizeChange(bytes));
}

function barElement(share, content) {
  const bar = h('span', {class: 'bar', 'aria-hidden': 'true'});
  bar.style.inlineSize = `${Math.max(0, Math.min(100, share || 0))}%`;
  return h('span', {class: 'barred'}, bar, content);
}

function pathElement(path) {
  const slash = path.lastIndexOf('/') + 1;
  const button = h('button', {class: 'copy', type: 'button', title: format.say('copy'),
                              'aria-label': format.say('copyOf', {path: shownPlain(path)})},
                   svg('svg', {viewBox: '0 0 16 16', 'aria-hidden': 'true'}, svg('path', {
                     d: 'M5.5 5.5V2.5h8v8h-3M2.5 5.5h8v8h-8z'})));
  button.addEventListener('click', async () => {
    const said = button.querySelector('.said') ??
      button.appendChild(h('span', {class: 'said', role: 'status'}));
    said.textContent = format.say(await copyText(copyable(path)) ? 'copied' : 'copyFailed');
    button.focus();
    setTimeout(() => said.remove(), 1500);
  });
  return h('span', {class: 'path'},
           h('span', {},
             h('span', {class: 'folder'}, shown(path.slice(0, slash))),
             h('span', {class: 'name'}, shown(path.slice(slash)))),
           button);
}

// A number to compare, or NaN for what is shown as unknown.
const known = text => format.isNumber(text) ? Number(text) : NaN;
const signed = text => format.isSigned(text) ? Number(text) : NaN;

// How each kind of column is written, compared and looked for.
const KINDS = {
  text: {cell: value => shown(value)},
  path: {cell: pathElement, header: true},
  name: {cell: value => shown(value), header: true},
  type: {cell: value => typeName(value), text: value => typeName(value), header: true},
  size: {number: true, key: known, cell: value => sizeElement(value, -1), text: format.size},
  quota: {
    number: true,
    // A quota of 0 is none, and so the greatest.
    key: value => Number(value) || Infinity,
    cell: value => value === '0' ? format.say('noLimit') : sizeElement(value, -1),
    text: value => value === '0' ? format.say('noLimit') : format.size(value)
  },
  count: {number: true, key: known, cell: format.number, text: format.number},
  change: {
    number: true, key: signed, cell: value => changeElement(value), text: format.sizeChange
  },
  countChange: {number: true, key: signed, cell: format.numberChange, text: format.numberChange},
  percent: {
    number: true,
    key: value => parseFloat(value),
    cell: value => barElement(parseFloat(value), format.percent(parseFloat(value))),
    text: value => format.percent(parseFloat(value))
  },
  outlook: {key: value => value.order, cell: value => value.text, text: value => value.text},
  time: {number: true, key: value => known(value) || NaN, cell: format.time, text: format.time}
};

export function typeName(label) {
  return format.nameOf('types', label.replace('reportUI_file_type_', ''));
}

function comparison(kind, index, direction) {
  const texts = format.compareTexts();
  const key = kind.key ?? (kind.number ? Number : undefined);
  return ({values: first}, {values: second}) => {
    if (!key) {
      const text = kind.text ?? String;
      return direction * texts(text(first[index]), text(second[index]));
    }
    const [one, two] = [key(first[index]), key(second[index])];
    // What is unknown comes last either way.
    return Number.isNaN(one) - Number.isNaN(two) || direction * (one === two ? 0 : one - two) || 0;
  };
}

class Table {
  // See table().
  constructor(columns, rows, {caption, csv, sorted}) {
    this.columns = columns.map(([name, kind]) => ({name, kind: KINDS[kind]}));
    this.rows = rows.map(values => ({values, line: this.line(values)}));
    this.caption = caption;
    this.all = false;
    this.body = h('tbody', {}, ...this.rows.map(({line}) => line));
    this.headers = this.columns.map((column, index) => this.header(column, index));
    if (sorted !== undefined) {
      this.headers[sorted].setAttribute('aria-sort',
                                        this.columns[sorted].kind.number ? 'descending' : 'ascending');
    }
    this.count = h('span', {class: 'count', role: 'status'});
    this.more = h('button', {type: 'button', class: 'more'});
    this.more.addEventListener('click', () => {
      this.all = !this.all;
      this.update();
    });
    this.element = h('div', {class: 'table'}, this.tools(csv), h(
      'div', {class: 'scroll', role: 'group', tabindex: 0, 'aria-label': caption},
      h('table', {}, h('caption', {class: 'unseen'}, caption), h('thead', {}, h('tr', {}, ...this.headers)),
        this.body)), this.more);
    this.body.addEventListener('keydown', event => this.move(event));
    this.update();
  }

  header({name, kind}, index) {
    const text = format.nameOf('columns', name);
    const button = h('button', {type: 'button'}, text);
    button.addEventListener('click', () => this.sort(index));
    // A head that holds a button isn't repeated on the pages of a print: it gets the text then.
    return h('th', {scope: 'col', class: kind.number && 'number', 'data-text': text}, button);
  }

  line(values) {
    return h('tr', {}, ...this.columns.map(({name, kind}, index) => h(
      kind.header ? 'th' : 'td',
      {scope: kind.header && 'row', class: `${name}${kind.number ? ' number' : ''}`},
      kind.cell(values[index]))));
  }

  tools(csv) {
    const tools = h('div', {class: 'tools'},
                    h('span', {class: 'title', 'aria-hidden': 'true'}, this.caption));
    if (this.rows.length >= FILTER_FROM) {
      this.filter = h('input', {type: 'search', placeholder: format.say('filter'),
                                'aria-label': format.say('filterLabel', {name: this.caption})});
      this.filter.addEventListener('input', () => this.update());
      tools.append(this.filter, this.count);
    }
    if (csv) {
      tools.append(h('a', {class: 'csv', href: csv}, format.say('csv')));
    }
    return tools;
  }

  sort(index) {
    const header = this.headers[index];
    const {kind} = this.columns[index];
    const before = header.getAttribute('aria-sort');
    // Numbers begin with the greatest, texts with the first.
    const direction = before ? (before === 'ascending' ? -1 : 1) : kind.number ? -1 : 1;
    this.headers.forEach(other => other.removeAttribute('aria-sort'));
    header.setAttribute('aria-sort', direction > 0 ? 'ascending' : 'descending');
    this.rows.sort(comparison(kind, index, direction));
    this.body.append(...this.rows.map(({line}) => line));
    this.update();
  }

  // Rows beyond the first have a class and not the attribute: a print has them all.
  update() {
    const wanted = (this.filter?.value ?? '').trim().toLocaleLowerCase();
    let found = 0;
    for (const {values, line} of this.rows) {
      const fits = wanted === '' || this.columns.some(({kind}, index) =>
        [String(values[index]), kind.text?.(values[index])].some(
          text => text?.toLocaleLowerCase().includes(wanted)));
      line.hidden = !fits;
      line.classList.toggle('later', fits && !this.all && found >= FIRST_ROWS);
      found += fits;
    }
    this.count.textContent = format.say(
      'rowCount', {n: format.number(found), m: format.number(this.rows.length)});
    this.setStop(this.sizes()[0]);
    this.more.hidden = found <= FIRST_ROWS;
    this.more.textContent = this.all ? format.say('showLess') :
      format.say('showAll', {n: format.number(found)});
  }

  sizes() {
    return [...this.body.querySelectorAll('tr:not([hidden]):not(.later) .bytes')];
  }

  setStop(size) {
    this.body.querySelector('.bytes[tabindex="0"]')?.setAttribute('tabindex', -1);
    size?.setAttribute('tabindex', 0);
  }

  // The sizes of a table are one tab stop, and arrow keys move between them.
  move(event) {
    const step = {ArrowUp: -1, ArrowDown: 1}[event.key];
    if (!step || !event.target.matches('.bytes')) {
      return;
    }
    const sizes = this.sizes();
    const next = sizes[sizes.indexOf(event.target) + step];
    event.preventDefault();
    if (next) {
      this.setStop(next);
      next.focus();
    }
  }
}

// The element of a table. `columns`: [name, kind] each, the name a key of the dictionary;
// `rows`: a value for each column; `options`: caption, address of the CSV file, and the index of
// the column that the rows are sorted by (numbers from the greatest, texts from the first).
export function table(columns, rows, options) {
  return new Table(columns, rows, options).element;
}
