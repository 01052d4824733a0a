// The page says what the facts say, and nothing else: of volumes, attention, incidents and of what
// it leaves out. Facts that are missing, broken or hostile harm nothing.
import assert from 'node:assert/strict';
import test from 'node:test';

import {ALL, assertSensible, choose, FORMAT, LANGUAGES, read, section, sections, textOf, withBlock, withPage} from './browser.mjs';
import {attention, daily, DAY, facts, GIB, growing, incident, NOW, textOfFacts, volume, withFacts} from './facts.mjs';

const page = read('hostile');
const plain = text => text.replace(/[\u00a0\u202f]/g, ' ');

// --- Volumes ------------------------------------------------------------------------------------

const jump = {date: NOW - 3 * DAY, bytes: 420 * GIB};
const step = daily(90, ago => (ago > 3 ? 400 : 820) * GIB);
const rising = daily(90, ago => (930 - 2.9 * ago) * GIB);
const short = (window, days) => ({
  forecast: {state: 'short', window, per_day: null}, samples: daily(days, () => 5 * GIB)});

// What a volume is, and how it is drawn: dashed, with a band, marked.
const SHAPES = [
  [volume('/full', 1000 * GIB, {level: 'critical', forecast: {state: 'full', per_day: null}}), false, false],
  [volume('/growing', 930 * GIB, {level: 'warning', forecast: growing(24, 19, 33), samples: rising}), true, false],
  [volume('/years', 930 * GIB, {forecast: growing(1500, 1096, 2500, 89), samples: rising}), true, false],
  [volume('/soon', 999.5 * GIB, {forecast: growing(0, 0, 1), samples: rising}), true, false],
  [volume('/day', 995 * GIB, {forecast: {...growing(1, 1, 3), jump}, samples: rising}), true, true],
  [volume('/jump', 820 * GIB, {forecast: {jump}, samples: step}), false, true],
  [volume('/fall', 400 * GIB, {forecast: {state: 'shrinking', jump: {...jump, bytes: -1.5 * GIB}}, samples: step}), false, true],
  [volume('/plateau', 500 * GIB), false, false], [volume('/fresh', 5 * GIB, short(3, 4)), false, false],
  [volume('/seldom', 5 * GIB, short(21, 3)), false, false],
  [volume('/unknown', 0, {size: 0, samples: []}), null, null]];

const WORDS = {
  en: ['full', 'full in about 24 days (19 to 33)|at the pace of the last 30 days', 'full in about 4 years (3 to 7)|at the pace of the last 89 days',
       'full within a day|at the pace of the last 30 days', 'full in about 1 day (1 to 3)|at the pace of the last 30 days|jumped by 420 GiB on Nov 11, 2023',
       'does not grow|jumped by 420 GiB on Nov 11, 2023', 'shrinks|fell by 1.5 GiB on Nov 11, 2023', 'does not grow',
       'too little history: 3 of 7 days', 'too little history: samples of 3 of 4 days', 'size unknown'],
  de: ['voll', 'in etwa 24 Tagen voll (19 bis 33)|nach dem Tempo der letzten 30 Tage', 'in etwa 4 Jahren voll (3 bis 7)|nach dem Tempo der letzten 89 Tage',
       'innerhalb eines Tages voll|nach dem Tempo der letzten 30 Tage', 'in etwa 1 Tag voll (1 bis 3)|nach dem Tempo der letzten 30 Tage|sprunghafter Anstieg um 420 GiB am 11.11.2023',
       'wächst nicht|sprunghafter Anstieg um 420 GiB am 11.11.2023', 'nimmt ab|sprunghafter Rückgang um 1,5 GiB am 11.11.2023', 'wächst nicht',
       'Verlauf zu kurz: 3 von 7 Tagen', 'Verlauf zu kurz: Messwerte von 3 von 4 Tagen', 'Größe unbekannt'],
  es: ['lleno', 'se llenará dentro de 24 días (de 19 a 33)|al ritmo de los últimos 30 días', 'se llenará dentro de 4 años (de 3 a 7)|al ritmo de los últimos 89 días',
       'se llenará en menos de un día|al ritmo de los últimos 30 días', 'se llenará dentro de 1 día (de 1 a 3)|al ritmo de los últimos 30 días|aumento repentino de 420 GiB el 11 nov 2023',
       'no crece|aumento repentino de 420 GiB el 11 nov 2023', 'disminuye|descenso repentino de 1,5 GiB el 11 nov 2023', 'no crece',
       'historial insuficiente: 3 de 7 días', 'historial insuficiente: muestras de 3 de 4 días', 'tamaño desconocido'],
  fr: ['plein', 'plein dans environ 24 jours (19 à 33)|au rythme des 30 derniers jours', 'plein dans environ 4 ans (3 à 7)|au rythme des 89 derniers jours',
       'plein en moins d’un jour|au rythme des 30 derniers jours', 'plein dans environ 1 jour (1 à 3)|au rythme des 30 derniers jours|hausse soudaine de 420 Gio le 11 nov. 2023',
       'n’augmente pas|hausse soudaine de 420 Gio le 11 nov. 2023', 'diminue|baisse soudaine de 1,5 Gio le 11 nov. 2023', 'n’augmente pas',
       'historique insuffisant : 3 sur 7 jours', 'historique insuffisant : relevés de 3 sur 4 jours', 'taille inconnue'],
  ja: ['満杯', '約 24 日後に満杯の見込み (19～33 日)|直近 30 日間のペースで', '約 4 年後に満杯の見込み (3～7 年)|直近 89 日間のペースで',
       '1 日以内に満杯の見込み|直近 30 日間のペースで', '約 1 日後に満杯の見込み (1～3 日)|直近 30 日間のペースで|2023/11/11 に 420 GiB 急増',
       '増加なし|2023/11/11 に 420 GiB 急増', '減少中|2023/11/11 に 1.5 GiB 急減', '増加なし',
       '履歴が不足しています: 7 日中 3 日分', '履歴が不足しています: 測定値が 4 日中 3 日分', 'サイズ不明'],
  zh: ['已满', '预计约 24 天后写满（19 至 33 天）|按最近 30 天的速度', '预计约 4 年后写满（3 至 7 年）|按最近 89 天的速度',
       '预计一天内写满|按最近 30 天的速度', '预计约 1 天后写满（1 至 3 天）|按最近 30 天的速度|2023年11月11日突增 420 GiB',
       '无增长|2023年11月11日突增 420 GiB', '正在减少|2023年11月11日突减 1.5 GiB', '无增长',
       '历史数据不足：7 天中仅有 3 天', '历史数据不足：4 天中仅有 3 天的采样', '大小未知']
};

const volumes = SHAPES.map(([one]) => one);
// The block says something else of them, which nobody is told.
const usage = `[\n${volumes.map(({id, used, free}) => `[ '${id}', ${used} , ${free}, '7%', '4321' ]`).join(',\n')}\n];\n</script>\n`;
const shapes = withFacts(withBlock(page, 'vornVolumeUsageData', usage), facts({volumes}));

test('each shape of a volume is told in its words, everywhere and in six languages', () => withPage(shapes, async view => {
  for (const language of LANGUAGES) {
    await choose(view, language);
    const cards = await view.$$eval('.card', all => all.map(card => [...card.querySelectorAll('.words, .basis')].map(
      part => part.textContent).join('|')));
    assert.deepEqual(cards.map(plain), WORDS[language], language);
    const rows = new Map((await section(view, 'volume_usage')).rows.slice(0, volumes.length).map(row => [row[0], row[2]]));
    assert.deepEqual(volumes.map(({id}) => plain(rows.get(id))), WORDS[language].map(text => text.split('|')[0]), language);
    assert.doesNotMatch(await view.locator('body > :not(script)').evaluateAll(all => all.map(each => each.outerHTML).join('')),
                        /4[.,\s]?321/);
  }
  assert.deepEqual(await view.$$eval('.card', all => all.map(({className}) => className.split(' ').at(-1))), volumes.map(({level}) => level));
  await assertSensible(view);
}));

test('only what grows has a forecast drawn, and its range around it', () => withPage(shapes, async view => {
  const drawn = new Map(await view.$$eval('.chart', all => all.map(one => [
    one.title, ['.forecast', '.range', '.jump'].map(part => one.querySelector(part)?.getAttribute('d') ?? null)])));
  const points = path => [...path.matchAll(/([\d.]+),([\d.]+)/g)].map(([, x, y]) => [Number(x), Number(y)]);
  const top = 8;  // where a volume is full
  for (const [{path, forecast}, isDashed, isMarked] of SHAPES) {
    const [dashed, range, mark] = drawn.get(path) ?? [];
    assert.deepEqual(drawn.has(path) ? [dashed !== null, range !== null, mark !== null] : [null, null, null],
                     [isDashed, isDashed, isMarked], path);
    if (path === '/growing') {
      const [now, full] = points(dashed), [start, soonest, , latest] = points(range);
      assert.deepEqual([start, full[1], soonest[1], latest[1]], [now, top, top, top]);
      const [low, high] = [soonest, latest].map(([x]) => (x - now[0]) / (full[0] - now[0]) * forecast.days);
      assert.ok(Math.abs(low - forecast.days_low) < .1 && Math.abs(high - forecast.days_high) < .1, `${low} to ${high}`);
    }
  }
  // The jump is marked where it ended.
  const [x, y] = await view.$eval('.chart[title="/jump"] .jump', each => each.getAttribute('transform').match(/[\d.]+/g).map(Number));
  assert.ok(x > 200 && y > top, `${x},${y}`);
  // Arrow keys tell what all held on a day.
  const charts = view.locator('.charts');
  await charts.focus();
  await view.keyboard.press('PageDown');
  assert.match(await charts.getAttribute('aria-valuetext'), /^Nov 7, 2023: .*\/jump 40%, /);
  assert.match((await textOf(view, '.chart[title="/growing"] .said-value'))[0], /^Nov 7, 2023: 91%$/);
}));

test('the drawing waits for a second day', async () => {
  const note = ['There are only samples of a single day yet. Each report and each run with --data global adds one.'];
  for (const [days, notes] of [[0, note], [1, note], [2, []]]) {
    const one = volume('/', 5 * GIB, short(Math.max(0, days - 1), days));
    await withPage(withFacts(page, facts({volumes: [one, volume('/size', 0, {size: 0})]})), async view => {
      assert.deepEqual((await section(view, 'volume_usage')).notes, notes);
      assert.equal(await view.locator('.history').count(), 1 - notes.length);
      await assertSensible(view);
    });
  }
});

test('volumes are called by their paths, and say what fills them', async () => {
  const cause = (kind, name, bytes, where = 'CAD') => ({kind, share: kind === 'owner' ? '' : where, name, bytes, since: NOW - 30 * DAY});
  const named = [volume('a-1f', 9 * GIB, {path: '/srv/日本', level: 'warning', forecast: {...growing(24, 19, 33), per_day: GIB},
                                          grown_by: [cause('share', '', 9 * GIB), cause('folder', 'new/a', 5 * GIB), cause('owner', 'anna', 2 * GIB)],
                                          filled_by: [cause('share', '', 700 * GIB)]}),
                 volume('/', 990 * GIB, {grown_by: [cause('owner', 'chen', GIB)], forecast: growing(900, 800, 1000)})];
  const share = "[\n[ 's', 'a-1f', '1' ]\n];\n</script>\n";
  await withPage(withFacts(withBlock(page, 'vornShareListData', share), facts({volumes: named})), async view => {
    assert.deepEqual(await textOf(view, '.card h3'), ['/srv/日本', '/']);
    assert.deepEqual((await section(view, 'share_list')).rows, [['s', '1 B', '100%', '/srv/日本']]);
    assert.ok((await view.locator('.letters.group').allTextContents()).some(text => text.startsWith('/srv/日本')));
    const [large, small] = (await textOf(view, '.card')).map(text => plain(text).replace(/\s+/g, ' '));
    assert.match(large, /\+7 GiB a week Grew since Oct 15, 2023 Share CAD \+9 GiB Folder CAD\/new\/a \+5 GiB Owner anna \+2 GiB Filled by Share CAD 700 GiB$/);
    assert.match(small, /mostly chen$/);
  });
});

test('sizes and percentages follow one rule', async () => {
  const SIZES = [[0, '0 B'], [1023, '1023 B'], [1024, '1 KiB'], [2176, '2.13 KiB'], [2208, '2.16 KiB'], [10234, '9.99 KiB'],
                 [12902, '12.6 KiB'], [102297, '99.9 KiB'], [102349, '100 KiB'], [1047552, '1023 KiB'], [1048063, '1023 KiB'], [1048064, '1 MiB'],
                 [1.5 * 2 ** 40, '1.5 TiB'], [1100 * 2 ** 60, '1100 EiB']];
  const PERCENTS = [[0, '0%'], [12, '12%'], [90.25, '90.3%'], [90.75, '90.8%'], [93.45, '93.5%'], [99.96, '99.9%'], [100, '100%'], [1234.5, '1234.5%']];
  const block = `[\n${SIZES.map(([bytes], i) => `[ 's${i}', '/', '${BigInt(bytes)}' ]`).join(',\n')}\n];\n</script>\n`;
  await withPage(withFacts(withBlock(page, 'vornShareListData', block), facts({
    volumes: PERCENTS.map(([percent], i) => volume(`/${i}`, 5, {percent}))})), async view => {
    const comma = text => text.replace('.', ',').replace('%', ' %');
    for (const [language, adapt] of [['en', text => text], ['de', comma], ['fr', text => comma(text).replace(/B$/, 'o')]]) {
      await choose(view, language);
      const shown = new Map((await section(view, 'share_list')).rows.map(([share, size]) => [share, size]));
      assert.deepEqual(SIZES.map((_, i) => shown.get(`s${i}`)), SIZES.map(([, text]) => adapt(text)));
      assert.deepEqual((await view.locator('.card .percent').allTextContents()).map(plain), PERCENTS.map(([, text]) => adapt(text)));
    }
  });
});

// --- Attention ----------------------------------------------------------------------------------

const VALUES = {
  volume_full: {volume: '/srv/a', percent: 100, used: GIB}, volume_used: {volume: '/srv/a', percent: 93.4, free: 2 * GIB},
  volume_fills: {volume: '/srv/a', days: 24, days_low: 19, days_high: 33, percent: 90, free: GIB, window: 30},
  volume_grew: {volume: '/srv/a', bytes: GIB, date: 1500000000},
  volume_grew_in: {volume: '/srv/a', bytes: GIB, date: 1500000000, place: 'CAD/b'},
  volume_grew_in_by: {volume: '/srv/a', bytes: GIB, date: 1500000000, place: 'CAD/b', owner: 'anna'},
  quota_over: {user: 'anna', volume: '/home', used: 12 * GIB, quota: 10 * GIB, percent: 120},
  quota_near: {user: 'anna', volume: '/home', used: 9 * GIB, quota: 10 * GIB, percent: 90}, quota_more: {n: 1234},
  share_largest: {share: 'CAD', bytes: 3 * GIB}, owner_most: {owner: 'chen', bytes: 4 * GIB},
  duplicates_possible: {bytes: 5 * GIB, groups: 7}, duplicates_confirmed: {bytes: 6 * GIB, groups: 7},
  data_oldest: {date: 1500000000, file: 'a/b.txt'}
};
const LINES = {
  volume_full: '/srv/a: full', volume_used: '/srv/a: 93.4% used, 2 GiB free', volume_fills: '/srv/a: full in about 24 days (19 to 33)',
  volume_grew: '/srv/a grew by 1 GiB since Jul 14, 2017', volume_grew_in: '/srv/a grew by 1 GiB since Jul 14, 2017, mostly in CAD/b',
  volume_grew_in_by: '/srv/a grew by 1 GiB since Jul 14, 2017, mostly in CAD/b and by anna',
  quota_over: 'anna is over the quota on /home: 12 GiB of 10 GiB', quota_near: 'anna has used 90% of the quota on /home',
  quota_more: 'Further users near or over their quota: 1,234', share_largest: 'The largest share is CAD with 3 GiB',
  owner_most: 'chen owns the most: 4 GiB', duplicates_possible: 'Possible duplicates could free 5 GiB',
  duplicates_confirmed: 'Confirmed duplicates could free 6 GiB', data_oldest: 'The oldest data is from Jul 14, 2017: a/b.txt'
};

test('what needs attention is said by its code, in the order of the facts, with its section', async () => {
  const codes = Object.keys(FORMAT.attention), isDuplicate = code => code.startsWith('duplicates_');
  const found = [...codes.filter(isDuplicate), ...codes.filter(code => !isDuplicate(code))].map(
    (code, i) => attention([['critical', 'warning', 'ok'][Math.floor(i / codes.length * 3)], code, VALUES[code]]));
  await withPage(withFacts(page, facts({attention: found})), async view => {
    const lines = await view.$$eval(':is(#attention, #glance) li', all => all.map(each => [
      each.className, each.querySelector('a').textContent, each.querySelector('a').hash]));
    assert.deepEqual(lines.map(line => line.map(plain)), found.map(({level, code}) => [level, LINES[code], `#${FORMAT.attention[code].section}`]));
    assert.equal(await view.locator('#attention li:visible').count(), 6);
    assert.match((await textOf(view, '#attention summary'))[0], /^and \d more$/);
    for (const language of LANGUAGES) {
      await choose(view, language);
      assert.doesNotMatch((await textOf(view, '#attention, #glance')).join(), /[{}_]|–/, language);
    }
  });
  const calm = attention(['ok', 'share_largest', VALUES.share_largest]), warned = attention(['warning', 'quota_more', {n: 1}]);
  for (const [fields, text, glance] of [
    [{quotas: [], attention: [calm]}, /^What needs attention\s+Nothing stands out\.$/, /^At a glance\s+The largest share is CAD with 3 GiB$/],
    [{volumes: [volume('/', 1)], attention: [warned]}, /^What needs attention\s+Warning\s+Further/], [{attention: [calm]}, undefined, /largest/], [{}]]) {
    await withPage(withFacts(page, facts(fields)), async view => {
      for (const [part, expected] of [['#attention', text], ['#glance', glance]]) {
        const [shown] = await textOf(view, part);
        assert.ok(expected ? expected.test(plain(shown)) : shown === undefined, shown);
      }
    });
  }
  // A section that the page hasn't is no link.
  await withPage(withFacts(page.replace(/<section data-report="share_list">[^]*?<\/section>\n/, ''), facts({attention: [calm]})), async view => {
    assert.equal(await view.locator('#glance a').count(), 0);
  });
});

test('what could free space stands with its sum, the most first', async () => {
  const sum = (name, value, bytes) => ({[name]: value, files: 1, bytes: bytes * GIB});
  await withPage(withFacts(page, facts({
    duplicates: {mode: 'content', groups: 1, files: 2, reclaimable: 3 * GIB}, volumes: [volume('/srv', 1, {outside: 2 * GIB}), volume('/', 1, {outside: -5})],
    ages: [sum('age', '365-1095', 50), sum('age', '1095-1825', 4), sum('age', '1825-', 2), sum('age', 'future', 70)],
    types: [sum('type', 'reportUI_file_type_log', 1), sum('type', 'reportUI_file_type_video', 90)].map(type => ({...type, shares: []}))})), async view => {
    assert.deepEqual((await textOf(view, '#next li')).map(text => plain(text).replace(/\s+/g, ' ')), [
      '6 GiB not changed for 3 years: archive it', '3 GiB in confirmed duplicates: remove the copies',
      '2 GiB on /srv outside the shares: find out what it is', '1 GiB in temporary files and logs: delete what nobody needs']);
  });
});

// --- Incidents ----------------------------------------------------------------------------------

test('incidents stand at the top, errors first, and beside what they concern', async () => {
  const all = [
    incident('warning', 'share_part', 'CAD: 17', 'Run again as root.'), incident('error', 'report_failed', 'large_file'),
    incident('error', 'share_missing', 'most_modify'),  // the name of a share
    incident('warning', 'compare_stopped', 'duplicate_file'), incident('warning', 'unheard_of', 'x', 'Something new.')];
  await withPage(withFacts(page, facts({complete: false, incidents: all})), async view => {
    assert.ok(await view.$eval('nav', nav => nav.nextElementSibling.id === 'incidents'));
    assert.equal(await view.locator('#incidents h2').textContent(), 'This report is incomplete');
    assert.deepEqual(await view.$$eval('#incidents li', lines => lines.map(each => [
      each.querySelector('.level').textContent, [...each.querySelector('div').children].map(part => part.textContent).join('|'),
      each.querySelector('a')?.hash])), [
      ['Error', 'The report Largest files failed|About large_file.', '#large_file'],
      ['Error', 'Share most_modify is missing from this report|About most_modify.', '#coverage'],
      ['Warning', 'Part of a share could not be read (CAD: 17)|Run again as root.', '#coverage'],
      ['Warning', 'The comparison of contents reached its time limit (Duplicate files)|About duplicate_file.', '#duplicate_file'],
      ['Warning', 'Something new.', undefined]]);
    const marked = selector => view.$$eval(selector, signs => signs.map(sign => [
      sign.parentElement.hash?.slice(1) ?? sign.closest('section').id, sign.textContent]));
    const marks = [['duplicate_file', 'Warning'], ['large_file', 'Error'], ['coverage', 'Error']];
    assert.deepEqual(await marked('nav .level'), [['incidents', 'Error'], ...marks]);
    assert.deepEqual(await marked('h2 .level'), marks);
  });
  const many = Array.from({length: 30}, (_, i) => incident('warning', 'share_part', `s${i}: 1`));
  for (const [fields, heading, visible] of [[{}, [], 0], [{incidents: many}, ['Warnings about this report'], 5]]) {
    await withPage(withFacts(page, facts(fields)), async view => {
      assert.deepEqual(await textOf(view, '#incidents h2'), heading);
      assert.equal(await view.locator('#incidents li:visible').count(), visible);
      assert.equal(await view.locator('#incidents li').count(), fields.incidents?.length ?? 0);
    });
  }
});

// --- Sections -----------------------------------------------------------------------------------

test('a section says that it failed, and that it leaves rows out, when the facts do', async () => {
  const told = (name, fields) => ({name, rows: 5, shown: 5, limit: 5, csv: null, ok: true, ...fields});
  const first = (what, n) => [`These are the first ${n} ${what}. The CSV file holds more.`], failed = ['This report failed. The log of the run says why.'];
  for (const cases of [
    {large_file: [{}, []], least_modify: [{rows: 12345, shown: 1000, limit: 1000}, first('rows', '1,000')], share_list: [{rows: 6, limit: null}, first('rows', 5)],
     duplicate_file: [{rows: 900, shown: 700, limit: 200}, first('groups', 200)], volume_usage: [{ok: false}, failed],
     file_group: [{rows: 101, shown: 100, limit: 100},
                  ['The page holds 100 rows of this report. What is beyond is not shown, so the users listed last may be incomplete.']]},
    {large_file: [{rows: 6}, first('rows', 5)], least_modify: [{ok: false, rows: 6}, [...failed, ...first('rows', 5)]]}]) {
    const reports = Object.entries(cases).map(([name, [fields]]) => told(name, fields));
    await withPage(withFacts(page, facts({volumes: [volume('/', GIB)], reports})), async view => {
      for (const [report, {notes}] of Object.entries(await sections(view))) {
        assert.deepEqual(notes.filter(note => !/^The account name|^No quotas/.test(note)), cases[report]?.[1] ?? [], report);
      }
    });
  }
  // Of those without a block.
  const users = ['These are the 100 users with the smallest usage. More are not shown.'];
  const quotas = "{\n'/' : [\n['a', 0, 0, -1.0]]}\n</script>\n";
  for (const [name, variable, block, fields, notes] of [
    ['quota_usage', 'vornQuotaUsageTable', quotas, {rows: 300, shown: 200, limit: 100}, users], ['quota_usage', 'vornQuotaUsageTable', quotas, {}, []],
    ['quota_usage', 'vornQuotaUsageTable', '', {ok: false}, failed], ['large_file', 'vornLargeFileData', '', {ok: false}, failed],
    ['large_file', 'vornLargeFileData', '', {rows: 0}, ['Nothing was found.']],
    ['large_file', 'vornLargeFileData', '</script>\n', {rows: 3}, ['The data of this report is missing. The log of the run says why.']]]) {
    await withPage(withFacts(withBlock(page, variable, block), facts({reports: [told(name, fields)]})), async view => {
      assert.deepEqual((await section(view, name)).notes, notes, name);
    });
  }
  // Only a CSV file that is there is linked.
  await withPage(withFacts(page, facts({reports: ALL.map(name => told(name, {csv: name === 'large_file' ? 'javascript:1' : null}))})), async view => {
    assert.deepEqual(await view.$$eval('a.csv', all => all.map(each => each.getAttribute('href'))), ['csv/large_file.csv']);
  });
});

// --- Harm ---------------------------------------------------------------------------------------

const summaryOf = view => view.$$eval('#no-facts, #volumes, #attention, #incidents, .charts', all => all.map(({id}) => id));

test('facts that are missing, cut or broken leave the sections, and a note', async t => {
  const text = textOfFacts(facts({volumes: [volume('/', GIB)]}));
  const bare = withBlock(page, FORMAT.facts_variable, '');
  let expected;
  await withPage(bare, async view => { expected = await sections(view); });
  const start = `<script type='text/javascript'>\nvar ${FORMAT.facts_variable} = `, end = ';\n</script>\n';
  for (const [name, block] of Object.entries({
    'missing': '', 'cut': `${start}${text.slice(0, 200)}`, 'cut at its end': `${start}${text}`, 'cut at once': start, 'no JSON': `${start}{it's}${end}`,
    'another format': `${start}${text.replace('"format":1', '"format":2')}${end}`, 'null': `${start}null${end}`, 'a list': `${start}[]${end}`,
    'a number': `${start}5${end}`, 'two lines': `${start}${text.replace(',', ',\n')}${end}`})) {
    await t.test(name, () => withPage(withBlock(page, FORMAT.facts_variable, block), async view => {
      assert.deepEqual(await summaryOf(view), ['no-facts']);
      assert.match((await textOf(view, '#no-facts'))[0], /^Warning\s+The summary of this report is missing or damaged\./);
      assert.deepEqual(await sections(view), expected);
      assert.equal(await view.locator('.host').textContent(), /data-host="(.*?)"/.exec(page)[1]);
    }));
  }
  await withPage(bare, async view => {
    assert.ok(!expected.volume_usage.rows.flat().includes('–'));
    await assertSensible(view);
  });
  // A block before them that is cut takes nothing away.
  await withPage(withBlock(withFacts(page, facts({volumes: [volume('/', 1)]})), 'vornLeastModifyData', "[\n[ 's', '/f', '1"), async view => {
    assert.ok((await summaryOf(view)).includes('volumes'));
  });
});

const full = facts({
  complete: false, volumes: [volumes[1], volumes[4], volumes[6]], quotas: [],
  incidents: [incident('error', 'report_failed', 'large_file'), incident('warning', 'share_part', 's: 1')],
  attention: Object.entries(VALUES).map(([code, values]) => attention(['warning', code, values])),
  reports: ALL.map(name => ({name, rows: 9, shown: 5, limit: 5, csv: null, ok: true}))});

// A copy in which `change` has made another value of each one, from the outermost on.
function changed(value, change, key = '') {
  const other = key === 'format' || key === '' ? value : change(value, key);
  return other !== value || typeof value !== 'object' || value === null ? other :
    Array.isArray(value) ? value.map(each => changed(each, change, `${key}[]`)) :
    Object.fromEntries(Object.entries(value).map(([name, each]) => [name, changed(each, change, name)]));
}

test('values of another kind throw nothing', async () => {
  const ODD = [null, -1, 0.5, 1e300, 'x', [[]], {length: 3}];
  let next = 0;
  const odd = () => ODD[next++ % ODD.length];
  for (const [what, change] of Object.entries({
    tops: odd, entries: (value, key) => key.endsWith('[]') ? odd() : value,
    leaves: value => typeof value === 'object' && value !== null ? value : odd()})) {
    for (let turn = 0; turn < 3; ++turn) {
      next = 2 * turn;
      await withPage(withFacts(page, changed(full, change)), async view => {
        const html = await view.locator('main').innerHTML();
        assert.doesNotMatch(html, /NaN|undefined|Infinity/, `${what} ${turn}`);
        assert.equal(await view.locator('section[data-report]').count(), ALL.length);
      });
    }
  }
});

test('no text of the facts is more than a text', async () => {
  const evil = 'document.title="run"';
  const TEXTS = [`</script><script>${evil}</script>`, `<img src=x onerror='${evil}'>`, '--><!--<script>', `javascript:${evil}`,
                 `");${evil};("`, '__proto__', 'constructor', '{outlook}{what}$&', 'gnp.\u202egpj\u2028\u0000\u{1f4a9}\ud800'];
  const codes = ['level', 'state', 'kind', 'code', 'section', 'name'];
  for (const kept of [codes, []]) {
    for (let turn = 0; turn < TEXTS.length; turn += 3) {
      let next = turn;
      const hostile = changed(full, (value, key) => typeof value === 'string' && !kept.includes(key) ? TEXTS[next++ % TEXTS.length] : value);
      await withPage(withFacts(page, hostile), async view => {
        assert.match(await view.title(), /^Storage report – /);
        assert.equal(await view.locator(':is(main, header) :is(img, script, iframe), a[href^=javascript]').count(), 0);
        const shown = await view.$$eval('.host, header p b, .card h3', all => all.map(each => {
          each.querySelectorAll('.chip').forEach(chip => { chip.textContent = chip.dataset.original; });
          return each.textContent;
        }));
        assert.deepEqual(shown, [hostile.host, hostile.profile, ...hostile.volumes.map(({path}) => path)]);
      });
    }
  }
});
