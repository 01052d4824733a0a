// Texts, numbers, sizes and times in the chosen language and the server's time zone.

export const UNKNOWN = '–';
const UNITS = ['', 'Ki', 'Mi', 'Gi', 'Ti', 'Pi', 'Ei'];

const dictionaries = new Map();
const formatters = new Map();  // making one takes longer than using it a hundred times
let language = 'en';
let zone = 'UTC';

function formatter(Kind, options, code = language) {
  const key = JSON.stringify([Kind.name, code, options]);
  if (!formatters.has(key)) {
    formatters.set(key, new Kind(code, options));
  }
  return formatters.get(key);
}
const dateFormat = (options, code) => formatter(Intl.DateTimeFormat, options, code);
const numberFormat = options => formatter(Intl.NumberFormat, options);

// The dictionaries stand in the page as JSON; one that a slip of the pen broke is left out.
export function loadDictionaries(root) {
  for (const element of root.querySelectorAll('script[data-language]')) {
    try {
      dictionaries.set(element.dataset.language, JSON.parse(element.textContent));
    } catch (error) {
      console.warn(`dictionary ${element.dataset.language}: ${error.message}`);
    }
  }
}

export const languages = () => [...dictionaries].map(([code, {name}]) => [code, name ?? code]);
export const currentLanguage = () => language;

// Takes the nearest language there is: de-AT, else de, else English.
export function chooseLanguage(code) {
  const nearest = [code, code.split('-')[0]].find(known => dictionaries.has(known));
  language = nearest ?? 'en';
}

export function chooseZone(name) {
  try {
    new Intl.DateTimeFormat('en', {timeZone: name});
    zone = name;
  } catch {
    zone = 'UTC';
  }
}
export const currentZone = () => zone;

function find(group, key) {
  const texts = [language, 'en'].map(code => dictionaries.get(code)?.[group]?.[key]);
  return texts.find(text => typeof text === 'string');  // every object has a "constructor"
}
export const hasText = (group, key) => find(group, key) !== undefined;

// The text `key` of a group with {placeholders} filled in.
export function say(key, values = {}, group = 'page') {
  return (find(group, key) ?? key).replace(/\{(\w+)\}/g, (all, name) => values[name] ?? all);
}

// Like say(), but as text and nodes, for values that are elements.
export function sayNodes(key, values, group = 'page') {
  return (find(group, key) ?? key).split(/\{(\w+)\}/).map(
    (piece, index) => index % 2 ? values[piece] ?? piece : piece);
}
export const nameOf = (group, key) => find(group, key) ?? key.replaceAll('_', ' ');

// Volumes are called by the path at which they are mounted; the blocks call some by a shorter name.
let paths = new Map();
export function callVolumes(known) {
  paths = new Map(known.map(({id, path}) => [id, path]));
}
export const volumeName = id => paths.get(id) || id;

export const isNumber = text => /^[0-9]+$/.test(text);

// A count: 12,345.
export function number(value) {
  return Number.isFinite(Number(value)) ? numberFormat({}).format(Number(value)) : UNKNOWN;
}

// A half goes up, as in the mail and the terminal.
const rounded = (value, digits) => Number(value.toFixed(digits));

// A figure as mail and terminal write it, too: at most `digits` decimals, no groups.
export function figure(value, digits = 0) {
  return Number.isFinite(value) ? numberFormat(
    {useGrouping: false, maximumFractionDigits: digits}).format(rounded(value, digits)) : UNKNOWN;
}

export function size(value) {
  let count = Number(value);
  if (!Number.isFinite(count) || count < 0) {
    return UNKNOWN;
  }
  let unit = 0;
  while (count >= 1023.5 && unit < UNITS.length - 1) {
    count /= 1024;
    ++unit;
  }
  return `${figure(count, count < 10 ? 2 : count < 100 ? 1 : 0)}\u00a0${UNITS[unit]}${say('unit', {}, 'facts')}`;
}

// A change: with its sign, and the true minus.
const signed = (value, text) => value > 0 ? `+${text}` : value < 0 ? `\u2212${text}` : text;
const magnitude = value => String(value).replace(/^-/, '');
export const isSigned = text => /^-?[0-9]+$/.test(text);
export const numberChange = value => isSigned(value) ?
  signed(Number(value), number(magnitude(value))) : UNKNOWN;
export const sizeChange = value => isSigned(value) ?
  signed(Number(value), size(magnitude(value))) : UNKNOWN;

export const exactSize = value => numberFormat(
  {style: 'unit', unit: 'byte', unitDisplay: 'long'}).format(BigInt(value));

// `value` is a number of hundredths. What is below 100 is never rounded to it: it isn't full yet.
export function percent(value) {
  return Number.isFinite(value) && value >= 0 ?
    numberFormat({style: 'percent', maximumFractionDigits: 1, useGrouping: false}).format(
      rounded(value < 100 ? Math.min(value, 99.9) : value, 1) / 100) : UNKNOWN;
}

// A span of days, in years where those are whole: "7–30 days", "1–3 years", "< 7 days".
export function days(low, high) {
  const isYears = (low === 0 ? high : low) % 365 === 0;
  const unit = count => numberFormat({style: 'unit', unit: isYears ? 'year' : 'day', unitDisplay: 'long'})
    .format(isYears ? count / 365 : count);
  return low === 0 ? `< ${unit(high)}` : high === undefined ? `≥ ${unit(low)}` :
    `${isYears && high % 365 === 0 ? low / 365 : low}–${unit(high)}`;
}

// `seconds` since the epoch; a time of 0 or before stands for none.
function toDate(seconds) {
  const date = new Date(Number(seconds) * 1000);
  return Number(seconds) > 0 && !Number.isNaN(date.getTime()) ? date : null;
}

export const isoTime = seconds => toDate(seconds)?.toISOString();

export function time(seconds) {
  const date = toDate(seconds);
  return date ? dateFormat({dateStyle: 'medium', timeStyle: 'short', timeZone: zone}).format(date) :
    UNKNOWN;
}

export function day(seconds) {
  const date = toDate(seconds);
  return date ? dateFormat({dateStyle: 'medium', timeZone: zone}).format(date) : UNKNOWN;
}

// The zone as people call it, such as "Central European Standard Time, Europe/Berlin".
export function zoneName(seconds) {
  const parts = dateFormat({timeZone: zone, timeZoneName: 'long'})
    .formatToParts(toDate(seconds) ?? new Date());
  const {value} = parts.find(part => part.type === 'timeZoneName');
  return value === zone ? value : `${value}, ${zone.replaceAll('_', ' ')}`;
}

// Milliseconds that read as the server's wall clock when taken as UTC: for scales, whose ticks then
// fall on the server's midnights. A clock is only ever set at a quarter of an hour, so the samples
// that one run took of all volumes are worked out once.
const QUARTER = 900;
const offsets = new Map();
export function wallClock(seconds) {
  const quarter = Math.floor(seconds / QUARTER);
  if (!offsets.has(quarter)) {
    const start = quarter * QUARTER * 1000;
    const parts = Object.fromEntries(dateFormat({
      timeZone: zone, hourCycle: 'h23', year: 'numeric', month: 'numeric', day: 'numeric',
      hour: 'numeric', minute: 'numeric', second: 'numeric'
    }, 'en-US').formatToParts(start).map(({type, value}) => [type, Number(value)]));
    offsets.set(quarter, Date.UTC(
      parts.year, parts.month - 1, parts.day, parts.hour, parts.minute, parts.second) - start);
  }
  return seconds * 1000 + offsets.get(quarter);
}

export const wallDay = (milliseconds, options) =>
  dateFormat({...options, timeZone: 'UTC'}).format(milliseconds);

export const compareTexts = () => new Intl.Collator(language, {numeric: true}).compare;
