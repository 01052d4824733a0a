#!/usr/bin/env python3
"""Writes a report page of a made-up server, for a look at the page without one.

    tools/demo_page.py FOLDER [--kind server|huge|tiny|damaged] [--language CODE] [--build build]

The folder gets report.html, put together by the real template script from blocks like those of the
program. Everything comes from one seed, so two pages of the same day are alike.
"""
import argparse
import json
import random
import shutil
import subprocess
import tempfile
import time
from pathlib import Path

ROOT = Path(__file__).resolve().parents[1]
GIB, DAY = 1 << 30, 86400
TYPES = ('video', 'image', 'disk_image', 'archive', 'document', 'database', 'backup', 'drawing',
         'source', 'audio', 'log', 'spreadsheet', 'temporary', 'other')
AGES = ('0-7', '7-30', '30-90', '90-365', '365-1095', '1095-1825', '1825-')
AGE_PARTS = (.06, .09, .14, .24, .27, .12, .08)  # of all bytes
ENDINGS = {'Engineering': 'iso qcow2 zip log', 'Marketing': 'psd pptx mp4', 'CAD': 'dwg step stl',
           'Videos': 'mov mkv mp4', 'Photos': 'raw jpg tif', 'Backups': 'bak vmdk tar'}
WORDS = ('annual', 'budget', 'draft', 'final', 'release', 'survey', 'team', 'scan', 'build', 'render',
         'harbour', 'model', 'sensor', 'plan', 'minutes', 'offer', 'campaign', 'master', 'import')
PEOPLE = ('anna bjoern chen dora emil farah goran hana ivo jana kofi lena marco nadia oskar petra '
          'quentin rosa sven tarik ulla vera wei xenia yusuf').split()

# Volume: size in GiB, used, growth a day in GiB, the shares with their parts, jump in GiB.
SERVER = {
    '/srv/projects': (8192, .912, 29, {'Engineering': .46, 'CAD': .27, 'Research': .18,
                                       'Marketing': .06}, 210),
    '/srv/media': (16384, .781, 21, {'Videos': .55, 'Photos': .33, 'Podcasts': .08}, 0),
    '/srv/home': (4096, .64, 2.2, {'Users': .82, 'Profiles': .12}, 0),
    '/srv/archive': (32768, .44, 0, {'Backups': .62, '2019-2023': .28, 'Scans': .05}, 0)}
HUGE = {f'/srv/volume{v:02}': (8192 << v % 3, .35 + .05 * v, (3 * v) % 17, {
    f'Department {v}-{s}': .28 - .03 * s for s in range(4 - v % 2 - (v > 9))}, 0) for v in range(12)}
TINY = {'/': (96, .18, 0, {'docs': .4}, 0)}


class Model:
    def __init__(self, kind, now):
        self.choice = random.Random(11)
        self.now = now
        self.volumes = {'server': SERVER, 'huge': HUGE, 'tiny': TINY}.get(kind, SERVER)
        self.people = PEOPLE[:2] if kind == 'tiny' else (
            [f'{name}.{name[::-1]}{i}' for i in range(10) for name in PEOPLE] if kind == 'huge' else PEOPLE)
        self.has_history = kind != 'tiny'
        self.days = 1000 if kind == 'huge' else 180  # of the history of volumes
        self.most_folders = 40 if kind == 'tiny' else 2000
        self.shares = []  # (name, volume, bytes, files, grown in a month)
        for path, (size, used, growth, shares, _) in self.volumes.items():
            for i, (name, part) in enumerate(shares.items()):
                grown = int(growth * 30 * GIB * (.71, .22, .1, -.03)[i % 4])
                bytes_ = int(size * used * part * GIB)
                self.shares.append((name, path, bytes_, bytes_ // 9_000_000 + 11, grown))
        self.folders = []
        for share in self.shares:
            self.add_folders(share[0], '.', share[2], share[3], 0)
        self.folders.sort(key=lambda row: (-row[2], len(row[1])))
        del self.folders[self.most_folders:]

    def add_folders(self, share, folder, bytes_, files, depth):
        days = min(2500, self.choice.lognormvariate(2.2 + depth * .8, 1.2)) if depth else .4
        self.folders.append((share, folder, bytes_, max(1, files), int(self.now - days * DAY)))
        if depth == 4 or bytes_ < GIB:
            return
        left = bytes_ * .93
        for word in self.choice.sample(WORDS, self.choice.randint(3, 8)):
            part = left * self.choice.uniform(.2, .55)
            left -= part
            name = f'{word} {self.choice.randint(2016, 2026)}' if depth % 2 else word
            self.add_folders(share, name if folder == '.' else f'{folder}/{name}', int(part),
                             int(files * part / (bytes_ or 1)), depth + 1)

    def parts(self, total, names, skew=.42):
        """Splits an amount among names, most to the first."""
        left, found = total, []
        for name in names:
            part = int(left * skew * self.choice.uniform(.7, 1.2))
            left -= part
            found.append((name, part))
        return found

    def samples(self, used, per_day, wobble, jump=0, days=89):
        walk = [used - per_day * ago - (jump if ago > 6 else 0) +
                (self.choice.uniform(-1, 1) * wobble if ago else 0) for ago in range(days, -1, -1)]
        return [[self.now - (days - i) * DAY, max(0, int(value))] for i, value in enumerate(walk)]

    def file(self, share):
        words = self.choice.sample(WORDS, 3)
        ending = self.choice.choice(ENDINGS.get(share, 'pdf docx zip xlsx db').split())
        path = next(path for name, path, *_ in self.shares if name == share)
        year, number = self.choice.randint(2016, 2026), self.choice.randint(1, 99)
        return f'{path}/{share}/{words[0]} {year}/{words[1]}-{words[2]}-{number}.{ending}'


def quoted(text):
    return "'" + str(text).replace('\\', '\\\\').replace("'", "\\'") + "'"


def rows_of(rows):
    return '[\n' + ',\n'.join('[ ' + ', '.join(map(quoted, row)) + ' ]' for row in rows) + '\n];\n'


def tables_of(tables):
    return '{\n' + ',\n'.join(f'{quoted(name)} : [\n' + ',\n'.join(
        '[' + ', '.join(row) + ']' for row in rows) + ']\n' for name, rows in tables.items()) + '}\n'


def grown(model, month):
    """Growth since each earlier report, of something that grows by so many bytes a month."""
    def since(days, bytes_a_file):
        return {'since': model.now - days * DAY, 'files': month // bytes_a_file,
                'bytes': month * days // 30}
    return {'last': since(1, 90 << 20), 'week': since(7, 20 << 20),
            'month': since(30, 5 << 20)} if model.has_history else None


def forecast(model, path):
    size, used, growth, _, jump = model.volumes[path]
    free = size * (1 - used)
    if not model.has_history:
        return {'state': 'short', 'days': None, 'days_low': None, 'days_high': None, 'per_day': None,
                'window': 0, 'jump': None}
    grows = growth > size * .0002
    days = free / growth if grows else 0
    return {'state': 'growing' if grows else 'steady', 'days': int(days) if grows else None,
            'days_low': int(days * .82) if grows else None, 'days_high': int(days * 1.3) if grows else None,
            'per_day': int(growth * GIB), 'window': 30,
            'jump': {'date': model.now - 6 * DAY, 'bytes': jump * GIB} if jump else None}


def volume_facts(model, path):
    size, used, growth, shares, jump = model.volumes[path]
    outlook = forecast(model, path)
    here = [share for share in model.shares if share[1] == path]
    explained = sum(share[2] for share in here)
    days = outlook['days'] if outlook['days'] is not None else 9999
    level = ('critical' if used >= .95 or days <= 14 and used >= .7 else
             'warning' if used >= .85 or days <= 60 and used >= .6 else 'ok')
    people = model.people[:4]
    causes = [('share', share[0], '', share[4]) for share in here]
    if here and here[0][4] > 0:
        folder = next(row for row in model.folders if row[0] == here[0][0] and row[1] != '.')
        causes.append(('folder', here[0][0], folder[1], int(here[0][4] * .8)))
        causes += [('owner', '', name, part) for name, part in model.parts(here[0][4], people[::-1])]
    filled = [('share', share[0], '', share[2]) for share in here] + [
        ('owner', '', name, part) for name, part in model.parts(explained, people)]

    def largest(found):
        return [{'kind': kind, 'share': share, 'name': name, 'bytes': amount,
                 'since': model.now - 30 * DAY} for kind, share, name, amount in
                sorted(found, key=lambda each: -each[3])[:5] if amount > 0]
    total, held = size * GIB, int(size * used * GIB)
    samples = (model.samples(held, growth * GIB, size * GIB * .0015, jump * GIB)
               if model.has_history else [[model.now, held]])
    return {'id': path, 'path': path, 'size': total, 'used': held, 'free': total - held,
            'percent': held / total * 100, 'level': level, 'forecast': outlook,
            'samples': samples,
            'explained': explained, 'outside': held - explained, 'filled_by': largest(filled),
            'grown_by': largest(causes) if model.has_history else None}


def share_facts(model):
    return sorted(({'name': name, 'path': f'{path}/{name}', 'volume': path, 'files': files,
                    'folders': files // 14, 'bytes': bytes_, 'allocated': bytes_, 'unreadable': 0,
                    'other': 2, 'whole': True, 'index': False, 'grown': grown(model, month),
                    'samples': model.samples(bytes_, month / 30, abs(month) / 40)}
                   for name, path, bytes_, files, month in model.shares),
                  key=lambda share: -share['bytes'])


def split_shares(model, shares, names, called, places_called):
    """What is in the shares, split among nine of `names` in each: records by size."""
    places = {}
    for share in shares:
        for name, part in model.parts(share['bytes'], model.choice.sample(names, min(len(names), 9))):
            places.setdefault(name, []).append({'share': share['name'], 'volume': share['volume'],
                                                'files': part >> 23, 'bytes': part})
    records = []
    for name, found in places.items():
        total = sum(place['bytes'] for place in found)
        records.append({called: name, 'files': sum(place['files'] for place in found), 'bytes': total,
                        'grown': grown(model, total // 60),
                        places_called: sorted(found, key=lambda place: -place['bytes'])})
    return sorted(records, key=lambda record: -record['bytes'])


def quota_facts(model):
    users = zip(model.people, (120, 60, 200, 80, 100, 50), (1.08, .94, .72, .6, .41, .12))
    return [{'volume': list(model.volumes)[-2], 'user': name, 'used': int(quota * share * GIB),
             'quota': quota * GIB, 'percent': share * 100, 'forecast': None,
             'level': 'critical' if share > 1 else 'warning' if share >= .9 else 'ok'}
            for name, quota, share in users]


def attention_of(model, facts):
    found = []

    def tell(level, code, section, **values):
        found.append({'level': level, 'code': code, 'section': section, 'values': values})
    for volume in facts['volumes']:
        same = {'volume': volume['path'], 'percent': volume['percent'], 'free': volume['free']}
        days = {key: volume['forecast'][key] for key in ('days', 'days_low', 'days_high', 'window')}
        if volume['level'] != 'ok' and days['days'] is not None:
            tell(volume['level'], 'volume_fills', 'volume_usage', **same, **days)
        elif volume['level'] != 'ok':
            tell(volume['level'], 'volume_used', 'volume_usage', **same)
    for user in facts['quotas'][:2]:
        tell(user['level'], 'quota_over' if user['percent'] > 100 else 'quota_near', 'quota_usage',
             **{key: user[key] for key in ('user', 'volume', 'used', 'quota', 'percent')})
    found.sort(key=lambda each: each['level'] != 'critical')
    for volume in facts['volumes']:
        for cause in (volume['grown_by'] or [])[:1]:
            tell('ok', 'volume_grew_in', 'growth', volume=volume['path'], place=cause['share'],
                 bytes=cause['bytes'] * 4 // 3, date=model.now - 30 * DAY)
    share, owner = facts['shares'][0], facts['owners'][0]
    tell('ok', 'share_largest', 'share_list', share=share['name'], bytes=share['bytes'])
    tell('ok', 'owner_most', 'file_owner', owner=owner['name'], bytes=owner['bytes'])
    if facts['duplicates']['groups']:
        tell('ok', 'duplicates_possible', 'duplicate_file', groups=facts['duplicates']['groups'],
             bytes=facts['duplicates']['reclaimable'])
    tell('ok', 'data_oldest', 'least_modify', date=model.now - 5400 * DAY, file='minutes 2011/plan.dwg')
    return found


INCIDENTS = [
    ('error', 'share_missing', 'Finance',
     'The folder /srv/home/Finance is not there: mount it, or remove the share from share.conf.'),
    ('warning', 'share_part', 'Users: 17', 'Folders could not be read: permission denied.'),
    ('error', 'report_failed', 'large_file', 'The rows of the report could not be written.')]


def facts_of(model, kind):
    shares = share_facts(model)
    order = {'critical': 0, 'warning': 1, 'ok': 2}
    types = split_shares(model, shares, TYPES, 'type', 'shares')
    for record in types:
        record['type'] = f"reportUI_file_type_{record['type']}"
    total = sum(share['bytes'] for share in shares)
    facts = {
        'format': 1, 'host': 'files', 'profile': 'weekly', 'time_zone': 'Europe/Berlin',
        'language': 'en', 'started': model.now - 1840, 'finished': model.now,
        'complete': kind != 'damaged',
        'incidents': [dict(zip(('level', 'kind', 'what', 'text'), each)) for each in INCIDENTS]
        if kind == 'damaged' else [],
        'volumes': sorted((volume_facts(model, path) for path in model.volumes), key=lambda volume: (
            order[volume['level']], volume['forecast']['days'] or 1e9)),
        'shares': shares, 'owners': split_shares(model, shares, model.people, 'name', 'places'),
        'types': types,
        'ages': [{'age': age, 'files': int(total * part) >> 22, 'bytes': int(total * part)}
                 for age, part in zip(AGES, AGE_PARTS)],
        'quotas': [] if kind == 'tiny' else quota_facts(model),
        'duplicates': {'mode': 'name', 'groups': 0, 'files': 0, 'reclaimable': 0} if kind == 'tiny'
        else {'mode': 'name', 'groups': 1873, 'files': 4201, 'reclaimable': 412 * GIB},
        'reports': []}
    facts['attention'] = attention_of(model, facts)
    return facts


# --- The blocks ---------------------------------------------------------------------------------

def files_of(model, facts, size, days):
    """Rows of share, path, bytes and time; `size` and `days` of the n-th."""
    names = [share['name'] for share in facts['shares']]
    chosen = model.choice.choices(names, k=200 if len(names) > 1 else 8)
    return [(share, model.file(share), size(n), int(model.now - days(n) * DAY))
            for n, share in enumerate(chosen)]


def copies_of(large):
    """Groups of two and three of the large files, each much smaller."""
    return [(n + 1, share, f'{Path(path).parent}/{where}{Path(path).name}', size // 40, changed)
            for n, (share, path, size, changed) in enumerate(large)
            for where in ('', 'copy/', 'old/')[:2 + n % 2]]


def changes_of(model, facts):
    """Rows of the growth report."""
    rows = []
    for since, part in (('last', 30), ('week', 4), ('month', 1)) if model.has_history else ():
        for kind, key, records in (('share', 'name', facts['shares']), ('owner', 'name', facts['owners']),
                                   ('type', 'type', facts['types'])):
            for record in records:
                place = (record[key], '') if kind == 'share' else ('', record[key])
                change = record['grown'][since]
                rows.append((since, kind, *place, change['files'], change['bytes']))
        rows += [(since, 'folder', share, folder, files // 9,
                  int(bytes_ * model.choice.uniform(-.03, .09)) // part)
                 for share, folder, bytes_, files, _ in model.folders[:60] if folder != '.']
    return rows


def ages_of(model, facts):
    return [(share['name'], age, int(share['files'] * part), int(share['bytes'] * part))
            for share in facts['shares']
            for age, part in zip(AGES, model.choice.sample(AGE_PARTS, len(AGE_PARTS)))]


def quotas_of(model, facts):
    """Of the first volume with quotas: user, quota, used, percent."""
    told = {user['user']: user for user in facts['quotas']}

    def row(name):
        quota = told[name]['quota'] if name in told else model.choice.randrange(2) * 80 * GIB
        used = told[name]['used'] if name in told else model.choice.randrange(70 * GIB)
        return quoted(name), str(quota), str(used), f'{used / quota * 100 if quota else -1:.1f}'
    return {user['volume']: [row(name) for name in model.people[:100]] for user in facts['quotas'][:1]}


def history_of(model, facts):
    """Of each volume: time and percent, the newest first."""
    def series(volume):
        (first, held), size = volume['samples'][0], volume['size']
        earlier = [[first - ago * DAY, held * (1 - .3 * ago / model.days) + model.choice.uniform(-1, 1) * size * .001]
                   for ago in range(model.days - len(volume['samples']), 0, -1)]
        return [(quoted(date), f'{used / size * 100:.4f}') for date, used in [*earlier, *volume['samples']]][::-1]
    return {volume['id']: series(volume) for volume in facts['volumes']} if model.has_history else None


def types_of(model, facts):
    """All files' types, cut as the page is, and those of some owners."""
    tables = {'vornAll': [(quoted(each['type']), quoted(place['share']), str(place['bytes']))
                          for each in facts['types'] for place in each['shares']][:100]}
    for owner in facts['owners'][:len(PEOPLE)]:
        share = quoted(owner['places'][0]['share'])
        tables[owner['name']] = [(quoted(f'reportUI_file_type_{name}'), share, str(part))
                                 for name, part in model.parts(owner['bytes'], TYPES[:8])]
    return tables


def blocks_of(model, facts):
    """Each report's block behind `var NAME = `; None for one without rows."""
    choice = model.choice
    large = files_of(model, facts, lambda n: int(900 * GIB * .96 ** n), lambda n: choice.expovariate(.004))
    rows = {
        'file_owner': [(owner['name'], place['share'], place['files'], place['bytes'])
                       for owner in facts['owners'] for place in owner['places']],
        'volume_usage': [(volume['id'], volume['used'], volume['free'], f"{volume['percent']:.1f}%",
                          volume['forecast']['days'] or '') for volume in facts['volumes']],
        'share_list': [(share['name'], share['volume'], share['bytes']) for share in facts['shares']],
        'duplicate_file': copies_of(large) if facts['duplicates']['groups'] else [],
        'large_file': [row[:3] for row in large],
        'least_modify': files_of(model, facts, lambda n: int(choice.paretovariate(.5) * 2 ** 20) % (300 * GIB),
                                 lambda n: 5400 - n * 9),
        'most_modify': files_of(model, facts, lambda n: int(choice.paretovariate(.6) * 2 ** 18) % (80 * GIB),
                                lambda n: n * .03),
        'folder_usage': model.folders, 'file_age': ages_of(model, facts), 'growth': changes_of(model, facts),
        'coverage': [(share['volume'], share['name'], share['files'], share['bytes'], share['allocated'], 0, 2)
                     for share in facts['shares']]}
    tables = {'quota_usage': quotas_of(model, facts), 'file_group': types_of(model, facts),
              'history': history_of(model, facts)}
    return {name: rows_of(found) if found else None for name, found in rows.items()} | {
        name: tables_of(found) if found else None for name, found in tables.items()}


def write_page(folder, facts, blocks, build, language):
    formats = json.loads((build / 'report_format.json').read_text())
    for report in formats['reports']:
        text = blocks[report['name']] or ''
        shown = text.count('\n[')
        limit = report['page_limit'] or None
        facts['reports'].append({
            'name': report['name'], 'rows': 10000 if limit and shown >= limit else shown, 'shown': shown,
            'limit': limit, 'csv': f"csv/{report['name']}.csv" if report['has_csv_rows'] else None,
            'ok': True})
    folder.mkdir(parents=True, exist_ok=True)
    with tempfile.TemporaryDirectory() as work:
        script = Path(work, 'build-template.sh')
        shutil.copy(ROOT / 'reportUI/build-template.sh', script)
        shutil.copytree(ROOT / 'reportUI/template', Path(work, 'template'))
        for name in ('report.js', 'report.css'):
            shutil.copy(build / 'reportUI/page/bundle' / name, Path(work, 'template', name))
        head, body = Path(work, 'head'), Path(work, 'body')

        def call(*words):
            subprocess.run([script, *words], check=True)
        call('header', head)
        call('lang', head, language)
        facts_line = json.dumps(facts).replace('<', '\\u003c')
        texts = [(report['variable'], blocks[report['name']]) for report in formats['reports']]
        with head.open('a') as file:
            for variable, text in [*texts, ('vornVolumeUsageDataHistory', blocks['history']),
                               (formats['facts_variable'], f'{facts_line};\n')]:
                if text:
                    file.write(f"<script type='text/javascript'>\nvar {variable} = {text}</script>\n")
        call('header', head, 'volume_usage')
        call('body', body)
        for report in formats['reports']:
            call('body', body, report['name'])
        call('tail', body)
        (folder / 'report.html').write_text(head.read_text() + body.read_text())


def main():
    parser = argparse.ArgumentParser(description=__doc__.split('\n')[0])
    parser.add_argument('folder', type=Path)
    parser.add_argument('--kind', choices=('server', 'huge', 'tiny', 'damaged'), default='server')
    parser.add_argument('--language', default='en')
    parser.add_argument('--build', type=Path, default=ROOT / 'build')
    wanted = parser.parse_args()
    model = Model(wanted.kind, int(time.time()) // DAY * DAY + 4 * 3600)
    facts = facts_of(model, wanted.kind)
    blocks = blocks_of(model, facts)
    if wanted.kind == 'damaged':
        blocks['large_file'] = blocks['large_file'][:900]
        blocks['file_owner'] = None
    write_page(wanted.folder, facts, blocks, wanted.build, wanted.language)
    print(wanted.folder / 'report.html')


if __name__ == '__main__':
    main()
