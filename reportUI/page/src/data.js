// Reads the data blocks of the page: each on its own, from its text, and never by running it.
//
// A block is what one report wrote: `var NAME = [` or `var NAME = {`, then a row a line. Account
// names stand in it as bare keys (john-doe, 007, __proto__), so a whole block may be no JavaScript,
// or JavaScript that says something else. A report that failed half-way leaves its block open, and
// its script element then swallows the blocks up to the next end tag.

const VALUE = /\s*(?:'((?:[^'\\]|\\.)*)'|([^\s',[\]{}]+))\s*(,|$)/y;
const ROW = /^\[(.*?)\][\]}, ]*;?$/;  // quotes end any value, so the shortest match is the row
const KEY = /^(?:'(.*)'|(.*?))\s*: \[$/;
const PUNCTUATION = /^[\][{}, ;]*$/;
const PLAIN = {n: '\n', t: '\t', r: '\r', b: '\b', f: '\f', v: '\v', 0: '\0'};

export function unescape(text) {
  return text.replace(/\\(?:u([0-9a-f]{4})|x([0-9a-f]{2})|(.))/gi, (_, unicode, byte, other) =>
    other === undefined ? String.fromCharCode(parseInt(unicode ?? byte, 16)) :
      PLAIN[other] ?? other);
}

// The values of a row's inside as texts, or null.
function valuesOf(inside) {
  const values = [];
  VALUE.lastIndex = 0;
  for (let match; (match = VALUE.exec(inside));) {
    values.push(match[1] === undefined ? match[2] : unescape(match[1]));
    if (match[3] === '') {
      return values;
    }
  }
  return null;
}

// The pieces of text that hold one block each.
export function piecesOf(root) {
  return [...root.querySelectorAll('script')].flatMap(
    script => script.textContent.split(/<script[^>]*>/));
}

// {text, open}: the text behind the variable's opening bracket, or undefined without a block.
function blockOf(pieces, variable) {
  for (const piece of pieces) {
    const match = new RegExp(`(?:^|\\n)var ${variable} = ([[{])\\n`).exec(piece);
    if (match) {
      return {text: piece.slice(match.index + match[0].length), open: match[1]};
    }
  }
  return undefined;
}

export const hasBlock = (pieces, variable) => blockOf(pieces, variable) !== undefined;

// The rows of a report with `width` columns: {tables: Map of name to rows, whole}, or
// undefined without a block. A report without named tables has one, named ''. `whole` is false when
// a line is no row, or the end is missing.
export function readReport(pieces, variable, width) {
  const block = blockOf(pieces, variable);
  if (block === undefined) {
    return undefined;
  }
  const {text, open} = block;
  const end = open === '[' ? /(?:^|\n)\]\s*;?\s*$/ : /\}\s*;?\s*$/;  // a row ends in a bracket, too
  const result = {tables: new Map(), whole: end.test(text)};
  let rows;
  for (const line of text.trimEnd().split('\n')) {
    const key = KEY.exec(line);
    if (key) {
      const name = key[1] === undefined ? key[2] : unescape(key[1]);
      rows = result.tables.get(name) ?? [];
      result.tables.set(name, rows);
      continue;
    }
    if (PUNCTUATION.test(line)) {
      continue;
    }
    const row = ROW.exec(line);
    const values = row && valuesOf(row[1]);
    if (!values || values.length !== width) {
      result.whole = false;
      continue;
    }
    if (!rows) {
      rows = [];
      result.tables.set('', rows);
    }
    rows.push(values);
  }
  return result;
}

// The value of `var NAME = VALUE;`, quoted or not, or undefined.
export function readVariable(pieces, name) {
  for (const piece of pieces) {
    const match = new RegExp(`(?:^|\\n)\\s*var ${name}\\s*=\\s*'?([^';\\n]*)`).exec(piece);
    if (match) {
      return match[1];
    }
  }
  return undefined;
}

// The value of `var NAME = VALUE;` where that is JSON in one line; undefined when it is missing, cut
// or broken.
export function readJson(pieces, name) {
  for (const piece of pieces) {
    const line = new RegExp(`(?:^|\\n)var ${name} = (.*)`).exec(piece)?.[1].trimEnd();
    if (line === undefined) {
      continue;
    }
    try {
      return line.endsWith(';') ? JSON.parse(line.slice(0, -1)) : undefined;
    } catch {
      return undefined;
    }
  }
  return undefined;
}
