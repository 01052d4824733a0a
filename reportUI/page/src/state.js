// What a reader has done to the page: filters, sorting, the folder that is open. It outlives a change
// of the language, and stands in the address, so that a link leads to just what was seen:
// #SECTION?KEY=VALUE&…
const state = new Map();
let anchor = '';

export function readAddress() {
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

function writeAddress() {
  const words = new URLSearchParams([...state].filter(([, value]) => value)).toString();
  try {
    history.replaceState(null, '', `#${encodeURIComponent(anchor)}${words && `?${words}`}`);
  } catch { /* where a page may have no address, as in a viewer's frame */ }
}

export const stateOf = key => state.get(key) ?? '';

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

// A link within the page brings its own anchor, and loses the rest. Whether it brought more.
export function followAnchor() {
  const hasWords = location.hash.includes('?');
  readAddress();
  if (!hasWords) {
    writeAddress();
  }
  return hasWords;
}
