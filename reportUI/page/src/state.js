// What a reader has done to the page: filters, sorting, the folder that is open. It outlives a change
// of the language, and stands in the address, so that a link leads to just what was seen:
// #SECTION?KEY=VALUE&…
const state = new Map();
let anchor = '';

function readAddress() {
  const [name, words = ''] = location.hash.slice(1).split(/\?(.*)/s);
  try {
    anchor = decodeURIComponent(name);
  } catch {  // somebody else's address
    anchor = '';
  }
  for (const [key, value] of new URLSearchParams(words)) {
    state.set(key, value);
  }
}
export const anchorOf = () => anchor;

const wordsOf = () => new URLSearchParams([...state].filter(([, value]) => value)).toString();
const WHOLE = 'whole';  // marks an address that tells all of the state
function setAddress(address) {
  try {
    history.replaceState(WHOLE, '', address);
  } catch { /* where a page may have no address, as in a viewer's frame */ }
}
function writeAddress() {
  const words = wordsOf();
  setAddress(`#${encodeURIComponent(anchor)}${words && `?${words}`}`);
}

export function begin() {
  readAddress();
  setAddress(undefined);
}

export const stateOf = key => state.get(key) ?? '';
// Whether something of `key`, or of what belongs to it, differs from how a page begins.
export const hasState = key => [...state].some(
  ([each, value]) => value && (each === key || each.startsWith(`${key}.`)));

// The address of a section with some of that.
export const addressOf = (section, values) => `#${section}?${new URLSearchParams(values)}`;

// `section`: where the reader is, for the address.
export function keep(key, value, section = anchor) {
  if (stateOf(key) !== value) {
    state.set(key, value);
    anchor = section;
    writeAddress();
  }
}

// A link within the page brings its own anchor, and adds to the rest; the way back leads to an address
// that tells all. Whether anything but the anchor has changed.
export function followAnchor() {
  const before = wordsOf();
  if (history.state === WHOLE) {
    state.clear();
  }
  readAddress();
  writeAddress();
  return wordsOf() !== before;
}
