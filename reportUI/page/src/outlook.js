// What the program expects of a volume, in words that mail and terminal use, too.
import * as format from './format.js';

const DAYS_IN_YEARS = 730;  // from so many on, years are told
const LEAST_SPAN = 7, LEAST_SAMPLES = 4;  // days that a forecast needs, and of how many samples

const say = (key, values) => format.say(key, values, 'facts');

// When something is full: "full in about 24 days (19 to 33)". `days` is a whole number.
export function fillsText({days, days_low: low, days_high: high}) {
  if (days === 0) {
    return say('fillsToday');
  }
  const isLong = days >= DAYS_IN_YEARS;
  const [n, from, to] = [days, low, high].map(
    count => format.figure(isLong ? Math.round(count / 365.25) : count));
  return say(isLong ? 'fillsYears' : days === 1 ? 'fillsDay' : 'fillsDays', {n, low: from, high: to});
}

function shortText({window}, samples) {
  return window < LEAST_SPAN ?
    say('shortSpan', {n: format.figure(window), m: LEAST_SPAN}) :
    say('shortDays', {n: format.figure(samples.length), m: LEAST_SAMPLES});
}

export function outlookText({size, forecast, samples}) {
  return size === 0 ? say('unknownSize') :
    forecast.state === 'growing' ? fillsText(forecast) :
    forecast.state === 'short' ? shortText(forecast, samples) : say(forecast.state);
}

export function jumpText({date, bytes}) {
  return say(bytes < 0 ? 'fell' : 'jumped',
             {size: format.size(Math.abs(bytes)), date: format.day(date)});
}

// What the outlook rests on, a text each.
export function basisTexts({size, forecast: {state, window, jump}}) {
  return size === 0 ? [] : [
    state === 'growing' && say('pace', {n: format.figure(window)}),
    jump && jumpText(jump)].filter(Boolean);
}

// For sorting by it: days, 0 for what is full, and nothing before what never is.
export function outlookOrder({size, forecast: {state, days}}) {
  return size === 0 ? Infinity : state === 'full' ? -1 : state === 'growing' ? days ?? Infinity :
    Infinity;
}
