// Tables: sorted, filtered, cut to their first rows, with totals, the CSV file and the paths to copy.
// Rows become elements when they are shown.
import {copyText, copyable, h, shown, shownPlain, svg} from './dom.js';
import * as format from './format.js';
import {isOpened, noteOpened} from './folds.js';
import {addressOf, keep, stateOf} from './state.js';

const FIRST_ROWS = 10;
const FEW_MORE = 4;  // rows that are shown rather than asked for
const AT_ONCE = 100;  // rows that become elements in one go
const FILTER_FROM = 6;  // fewer rows are taken in at a glance

// Number, decimals and unit in boxes of their own, so that they stand below each other.
const partsOf = text => /^(.*?\d)([.,]\d+)?(\D*)$/.exec(text)?.slice(1) ?? [text];
function aligned(text) {
  const [whole, decimals, unit] = partsOf(text);
  return unit === undefined ? [text] : [whole, h('span', {class: 'decimals'}, decimals ?? ''),
                                        h('span', {class: 'unit'}, unit)];
}

// `text` is what is shown, `exact` the number of bytes.
export function sizeElement(bytes, tabindex = 0, content = format.size(bytes)) {
  if (!format.isNumber(String(bytes).replace(/^-/, ''))) {
    return h('span', {}, format.UNKNOWN);
  }
  const exact = format.exactSize(bytes);
  return h('span', {class: 'bytes', tabindex, title: exact, 'data-exact': exact},
           ...[content].flat());
}

const cellOfSize = bytes => sizeElement(bytes, -1, aligned(format.size(bytes)));
const cellOfChange = bytes => sizeElement(bytes, -1, aligned(format.sizeChange(bytes)));
function cellOfPercent(value) {
  const [whole, ...rest] = partsOf(format.percent(value));
  return h('span', {}, whole, h('span', {class: 'hundredths'}, ...rest));
}

export function barElement(share, content) {
  const bar = h('span', {class: 'bar', 'aria-hidden': 'true'});
  bar.style.inlineSize = `${Math.max(0, Math.min(100, share || 0))}%`;
  return h('span', {class: 'barred'}, bar, h('span', {}, ...[content].flat()));
}

export function copyButton(path) {
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
  return button;
}

function pathElement(path) {
  const slash = path.lastIndexOf('/') + 1;
  return h('span', {class: 'path'},
           h('span', {class: 'long'},
             h('span', {class: 'folder'}, shown(path.slice(0, slash))),
             h('span', {class: 'name'}, shown(path.slice(slash)))),
           copyButton(path));
}

// The clock in an element of its own, which a phone leaves out.
function timeElement(value) {
  const [time, day] = [format.time(value), format.day(value)];
  return time === day || !time.startsWith(day) ? time : h('span', {}, day, h('span', {class: 'clock'},
                                                                            time.slice(day.length)));
}

// A number to compare, or NaN for what is shown as unknown.
const known = text => format.isNumber(text) ? Number(text) : NaN;
const signed = text => format.isSigned(text) ? Number(text) : NaN;

// How each kind of column is written, compared, looked for (`text`) and summed up (`sum`).
const KINDS = {
  text: {cell: value => shown(value), text: String},
  path: {cell: pathElement, header: true, text: String},
  name: {cell: value => h('span', {class: 'long'}, shown(value)), header: true, text: String},
  // A share and a folder in it.
  place: {
    cell: ([share, folder]) => h('span', {class: 'long'}, ...folder === '.' ? [shown(share)] :
      [h('span', {class: 'in'}, shown(share), ' / '), shown(folder)]),
    text: ([share, folder]) => folder === '.' ? share : `${share}/${folder}`, header: true
  },
  type: {cell: value => typeName(value), text: value => typeName(value), header: true},
  age: {cell: value => ageName(value), key: value => ageOrder(value), header: true},
  size: {number: true, key: known, cell: cellOfSize, sum: cellOfSize},
  quota: {
    number: true,
    // A quota of 0 is none, and so the greatest.
    key: value => Number(value) || Infinity,
    cell: value => value === '0' ? format.say('noLimit') : cellOfSize(value)
  },
  count: {number: true, key: known, cell: format.number, sum: format.number},
  change: {number: true, key: signed, cell: cellOfChange, sum: cellOfChange},
  countChange: {number: true, key: signed, cell: format.numberChange, sum: format.numberChange},
  part: {number: true, key: Number, cell: value => cellOfPercent(Number(value))},
  percent: {
    number: true,
    key: value => parseFloat(value),
    cell: value => barElement(parseFloat(value), cellOfPercent(parseFloat(value)))
  },
  // What is left of a volume's use: less than nothing where files share blocks.
  outside: {
    number: true, key: Number,
    cell: value => Number(value) < 0 ? format.say('outsideLess') : cellOfSize(value)
  },
  outlook: {key: value => value.order, cell: value => value.text, text: value => value.text},
  element: {key: value => value.order, cell: value => value.make()},
  time: {number: true, key: value => known(value) || NaN, cell: timeElement}
};

export function typeName(label) {
  return format.nameOf('types', label.replace('reportUI_file_type_', ''));
}

export const ageOrder = age => Number.isNaN(parseInt(age, 10)) ? Infinity : parseInt(age, 10);
export function ageName(age) {
  const [, low, high] = /^(\d+)-(\d*)$/.exec(age) ?? [];
  return low === undefined ? age === 'future' ? format.say('future') : age :
    format.days(Number(low), high === '' ? undefined : Number(high));
}

function comparison({key, number, text}, index, direction) {
  const texts = format.compareTexts();
  const order = key ?? (number ? Number : undefined);
  return ({values: first}, {values: second}) => {
    if (!order) {
      return direction * texts(text(first[index]), text(second[index]));
    }
    const [one, two] = [order(first[index]), order(second[index])];
    // What is unknown comes last either way.
    return Number.isNaN(one) - Number.isNaN(two) || direction * (one === two ? 0 : one - two) || 0;
  };
}

const wordsOf = text => text.toLocaleLowerCase().split(/\s+/).filter(Boolean);

// What is looked for in all tables, and the tables that are there.
let sought = [];
const tables = new Set();
export function forgetTables() {
  tables.forEach(({waiting}) => clearTimeout(waiting));
  tables.clear();
}
export function seek(text) {
  sought = wordsOf(text);
  tables.forEach(each => each.element.isConnected ? each.update() : tables.delete(each));
}
// Shows all rows that fit, at once, until update() is called.
export const showAllRows = () => tables.forEach(each => each.fill(each.found.length, Infinity));
export const showFewRows = () => tables.forEach(each => each.update());
export const isSought = () => sought.length > 0;
// Rows found in a part of the page.
export const foundIn = part => [...tables].filter(({element}) => part.contains(element)).reduce(
  (sum, {found}) => sum + found.length, 0);

class Table {
  // See table().
  constructor(columns, rows, {key, caption, csv, sorted, beyond = 0, detail}) {
    this.columns = columns.map(([name, kind, options]) => ({name, kind: KINDS[kind], ...options}));
    this.rows = rows.map((values, at) => ({values, at}));
    Object.assign(this, {key, caption, beyond, detail, found: [], sorted: [sorted, 0]});
    this.columns.forEach((column, index) => {
      const sizes = column.bar ? rows.map(values => Math.abs(column.kind.key(values[index])) || 0) : [];
      column.most = sizes.reduce((most, size) => Math.max(most, size), 0);
    });
    const [sort, all, ...filter] = stateOf(key).split('!');
    this.all = all === 'all';
    this.body = h('tbody');
    this.foot = h('tr');
    this.headers = this.columns.map((column, index) => this.header(column, index));
    this.count = h('span', {class: 'count', role: 'status'});
    this.more = h('button', {type: 'button', class: 'more'});
    this.more.addEventListener('click', () => this.toggle());
    this.hasTotal = this.rows.length > 1 && this.columns.some(({sum}) => sum);
    this.element = h('div', {class: 'table'}, this.tools(csv, filter.join('!')), h(
      'div', {class: 'scroll', role: 'group', tabindex: 0, 'aria-label': caption},
      h('table', {}, h('caption', {class: 'unseen'}, caption), h('thead', {}, h('tr', {}, ...this.headers)),
        this.body, this.hasTotal ? h('tfoot', {}, this.foot) : null)), this.more);
    this.body.addEventListener('keydown', event => this.move(event));
    const [, sign, index] = /^(-?)(\d+)$/.exec(sort) ?? [];
    if (this.columns[index]) {
      this.order(Number(index), sign ? -1 : 1);
    } else if (sorted !== undefined) {
      this.mark(sorted, this.columns[sorted].kind.number ? -1 : 1);
    }
    tables.add(this);
    this.update();
  }

  header({name, kind, low}, index) {
    const text = format.nameOf('columns', name);
    const button = h('button', {type: 'button'}, text);
    button.addEventListener('click', () => this.sort(index));
    // A head that holds a button isn't repeated on the pages of a print: it gets the text then.
    return h('th', {scope: 'col', class: `${kind.number ? 'number' : ''}${low ? ' low' : ''}`,
                    'data-text': text}, button);
  }

  line(row) {
    const cells = this.columns.map(({name, kind, bar, low, most}, index) => {
      const value = row.values[index];
      const cell = kind.cell(value);
      return h(kind.header ? 'th' : 'td', {
        scope: kind.header && 'row',
        class: `${name}${kind.number ? ' number' : ''}${low ? ' low' : ''}`},
               bar && most ? barElement(Math.abs(kind.key(value)) / most * 100, cell) : cell);
    });
    const line = h('tr', {}, ...cells);
    const named = this.columns.findIndex(({kind}) => kind.header && kind.text);
    if (this.filter && named >= 0) {
      cells[named].append(this.linkTo(this.columns[named].kind.text(row.values[named])));
    }
    row.lines = [line];
    if (this.detail) {
      cells[0].prepend(this.opener(row));
    }
    return row.lines;
  }

  // The address of the table with this row alone.
  linkTo(text) {
    return h('a', {class: 'here', tabindex: -1, 'aria-label': format.say('rowLink'),
                   href: addressOf(this.key.replace(/\..*/, ''), {[this.key]: `!!${text}`})});
  }

  // A button that opens what belongs to a row below it.
  opener(row) {
    const [line] = row.lines;
    const button = h('button', {type: 'button', class: 'opener', 'aria-label': format.say('open')});
    const key = `${this.key}.${this.detail.name(row.values)}`;
    let below;
    const set = isOpen => {
      button.setAttribute('aria-expanded', String(isOpen));
      below ??= isOpen ? h('tr', {class: 'below'}, h('td', {colspan: this.columns.length},
                                                    this.detail.make(row.values))) : undefined;
      row.lines = isOpen ? [line, below] : [line];
    };
    button.addEventListener('click', () => {
      const isOpen = row.lines.length > 1;
      noteOpened(key, !isOpen);
      set(!isOpen);
      isOpen ? below.remove() : line.after(below);
    });
    set(isOpened(key));
    return button;
  }

  tools(csv, filter = '') {
    const tools = h('div', {class: 'tools'},
                    h('span', {class: 'title', 'aria-hidden': 'true'}, this.caption));
    if (this.rows.length >= FILTER_FROM) {
      this.filter = h('input', {type: 'search', placeholder: format.say('filter'), value: filter,
                                'aria-label': format.say('filterLabel', {name: this.caption})});
      this.filter.addEventListener('input', () => this.changed());
      tools.append(this.filter);
    }
    if (this.filter || this.beyond > 0) {
      tools.append(this.count);
    }
    if (csv) {
      tools.append(h('a', {class: 'csv', href: csv}, format.say('csv')));
    }
    return tools;
  }

  changed() {
    this.update();
    const [index, direction] = this.sorted;
    this.keep(direction ? `${direction < 0 ? '-' : ''}${index}` : '');
  }

  keep(sort) {
    const all = this.all ? 'all' : '';
    const filter = this.filter?.value ?? '';
    keep(this.key, sort || all || filter ? [sort, all, filter].join('!') : '',
         this.key.replace(/\..*/, ''));
  }

  mark(index, direction) {
    this.headers.forEach(other => other.removeAttribute('aria-sort'));
    this.headers[index].setAttribute('aria-sort', direction > 0 ? 'ascending' : 'descending');
  }

  order(index, direction) {
    this.sorted = [index, direction];
    this.mark(index, direction);
    this.rows.sort(comparison(this.columns[index].kind, index, direction));
  }

  sort(index) {
    const before = this.headers[index].getAttribute('aria-sort');
    // Numbers begin with the greatest, texts with the first.
    const first = this.columns[index].kind.number ? -1 : 1;
    this.order(index, before ? (before === 'ascending' ? -1 : 1) : first);
    this.changed();
  }

  // "Fewer" keeps the button where the reader has it.
  toggle() {
    const before = this.more.getBoundingClientRect().top;
    this.all = !this.all;
    this.changed();
    if (!this.all) {
      window.scrollBy({top: this.more.getBoundingClientRect().top - before, behavior: 'instant'});
    }
  }

  // All words, in whatever order, in whatever columns.
  fits(row, words) {
    row.text ??= this.columns.map(({kind}, index) => kind.text?.(row.values[index]) ?? '').join('\n')
      .toLocaleLowerCase();
    return words.every(word => row.text.includes(word));
  }

  update() {
    const words = [...wordsOf(this.filter?.value ?? ''), ...sought];
    this.found = words.length ? this.rows.filter(row => this.fits(row, words)) : this.rows;
    const {length} = this.found;
    const few = length <= FIRST_ROWS + FEW_MORE;
    this.fill(this.all || few ? length : FIRST_ROWS);
    const numbers = {n: format.number(length), m: format.number(this.rows.length)};
    // What the total says isn't said again.
    this.count.textContent = [(words.length || this.beyond > 0) && format.say('rowCount', numbers), this.beyond > 0 &&
      format.say('moreInCsv', {n: format.number(this.beyond)})].filter(Boolean).join(' ');
    this.more.hidden = few;
    this.more.classList.toggle('less', this.all);
    this.more.textContent = this.all ? format.say('showLess') : format.say('showAll', {n: numbers.n});
    this.total();
  }

  // The first rows at once, the others when the browser has time for them.
  fill(count, atOnce = AT_ONCE) {
    clearTimeout(this.waiting);
    const add = from => {
      const lines = this.found.slice(from, Math.min(count, from + atOnce)).flatMap(
        row => row.lines ?? this.line(row));
      // Many values at once would not fit on the stack.
      const added = document.createDocumentFragment();
      lines.forEach(line => added.append(line));
      from ? this.body.append(added) : this.body.replaceChildren(added);
      if (from + atOnce < count) {
        this.waiting = setTimeout(() => add(from + atOnce));
      }
    };
    add(0);
    this.setStop(this.sizes()[0]);
  }

  total() {
    if (!this.hasTotal) {
      return;
    }
    this.foot.replaceChildren(...this.columns.map(({name, kind, sum, low}, index) => {
      const cell = content => h('td', {class: `${name}${kind.number ? ' number' : ''}${low ? ' low' : ''}`},
                                content);
      if (!index) {
        return h('th', {scope: 'row'}, format.say('total', {n: format.number(this.found.length)}));
      }
      return sum ? cell(kind.sum(String(this.found.reduce(
        (all, {values}) => all + (kind.key(values[index]) || 0), 0)))) : cell(null);
    }));
  }

  sizes() {
    return [...this.body.querySelectorAll('.bytes')];
  }

  setStop(size) {
    this.body.querySelectorAll('.bytes[tabindex="0"]').forEach(each => each.setAttribute('tabindex', -1));
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

// The element of a table.
//   columns   [name, kind, {bar, sum, low}] each: the name a key of the dictionary, `bar` for one
//             behind the value, `sum` for a total, `low` for what a phone leaves out
//   rows      a value for each column
//   options   key: of its state, begins with the section's name; caption; csv: address of the file;
//             sorted: index of the column that the rows come sorted by (numbers from the greatest,
//             texts from the first); beyond: rows that only the file has; detail: {name, make} of a
//             row's values, for what a button opens below it
export function table(columns, rows, options) {
  return new Table(columns, rows, options).element;
}

// With a column behind column `index` that says how much of all each row's size is.
export function withParts(columns, rows, index) {
  const total = rows.reduce((sum, values) => sum + (Number(values[index]) || 0), 0);
  const insert = (list, value) => list.toSpliced(index + 1, 0, value);
  return [insert(columns, ['part', 'part', {low: true}]), rows.map(
    values => insert(values, String(total > 0 ? Number(values[index]) / total * 100 : NaN)))];
}
