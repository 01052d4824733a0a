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
AGE_BOUNDS = (7, 30, 90, 365, 1095, 1825)
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
        return f'{path}/{share}/{words[0]} {self.choice.randint(2016, 2026)}/{words[1]}-{words[2]}-{self.choice.randint(1, 99)}.{ending}'


def quoted(text):
    return "'" + str(text).replace('\\', '\\\\').replace("'", "\\'") + "'"


def rows_of(rows):
    return '[\n' + ',\n'.join('[ ' + ', '.join(map(quoted, row)) + ' ]' for row in rows) + '\n];\n'


def tables_of(tables):
    return '{\n' + ',\n'.join(f'{quoted(name)} : [\n' + ',\n'.join(
        '[' + ', '.join(row) + ']' for row in rows) + ']\n' for name, rows in tables.items()) + '}\n'


def grown(model, month):
    return {name: {'since': model.now - days * DAY, 'files': month // days_part, 'bytes': month * days // 30}
            for name, days, days_part in (('last', 1, 90 << 20), ('week', 7, 20 << 20), ('month', 30, 5 << 20))}


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
    return {'id': path, 'path': path, 'size': total, 'used': held, 'free': total - held,
            'percent': held / total * 100, 'level': level, 'forecast': outlook,
            'samples': model.samples(held, growth * GIB, size * GIB * .0015, jump * GIB) if model.has_history
            else [[model.now, held]],
            'explained': explained, 'outside': held - explained, 'filled_by': largest(filled),
            'grown_by': largest(causes) if model.has_history else None}


def facts_of(model, kind):
    volumes = sorted((volume_facts(model, path) for path in model.volumes), key=lambda volume: (
        {'critical': 0, 'warning': 1, 'ok': 2}[volume['level']], volume['forecast']['days'] or 1e9))
    shares = sorted(({
        'name': name, 'path': f'{path}/{name}', 'volume': path, 'files': files, 'folders': files // 14,
        'bytes': bytes_, 'allocated': bytes_, 'unreadable': 0, 'other': 2, 'whole': True, 'index': False,
        'grown': grown(model, month) if model.has_history else None,
        'samples': model.samples(bytes_, month / 30, abs(month) / 40)} for name, path, bytes_, files, month in
        model.shares), key=lambda share: -share['bytes'])
    owners, types = {}, {}
    for share in shares:
        for table, names, key in ((owners, model.choice.sample(model.people, min(len(model.people), 9)), 'places'),
                                  (types, model.choice.sample(TYPES, 9), 'shares')):
            for name, part in model.parts(share['bytes'], names):
                table.setdefault(name, []).append({'share': share['name'], 'volume': share['volume'],
                                                   'files': part >> 23, 'bytes': part})

    def summed(table, key, name_key):
        return sorted(({name_key: name, 'files': sum(place['files'] for place in places),
                        'bytes': sum(place['bytes'] for place in places),
                        'grown': grown(model, sum(place['bytes'] for place in places) // 60) if model.has_history else None,
                        key: sorted(places, key=lambda place: -place['bytes'])}
                       for name, places in table.items()), key=lambda each: -each['bytes'])
    owner_list = summed(owners, 'places', 'name')
    type_list = [{**each, 'type': f"reportUI_file_type_{each['type']}"} for each in summed(types, 'shares', 'type')]
    total = sum(share['bytes'] for share in shares)
    ages = [{'age': age, 'files': part >> 22, 'bytes': part} for age, part in zip(
        AGES, (int(total * weight) for weight in (.06, .09, .14, .24, .27, .12, .08)))]
    attention = []

    def tell(level, code, section, **values):
        attention.append({'level': level, 'code': code, 'section': section, 'values': values})
    for volume in volumes:
        outlook = volume['forecast']
        if volume['level'] != 'ok' and outlook['days'] is not None:
            tell(volume['level'], 'volume_fills', 'volume_usage', volume=volume['path'], days=outlook['days'],
                 days_low=outlook['days_low'], days_high=outlook['days_high'], percent=volume['percent'],
                 free=volume['free'], window=30)
        elif volume['level'] != 'ok':
            tell(volume['level'], 'volume_used', 'volume_usage', volume=volume['path'],
                 percent=volume['percent'], free=volume['free'])
    quotas = [] if kind == 'tiny' else [
        {'volume': list(model.volumes)[-2], 'user': name, 'used': int(quota * share * GIB), 'quota': quota * GIB,
         'percent': share * 100, 'level': 'critical' if share > 1 else 'warning' if share >= .9 else 'ok',
         'forecast': None} for name, quota, share in zip(model.people, (120, 60, 200, 80, 100, 50), (1.08, .94, .72, .6, .41, .12))]
    for user in quotas[:2]:
        tell(user['level'], 'quota_over' if user['percent'] > 100 else 'quota_near', 'quota_usage', user=user['user'],
             volume=user['volume'], used=user['used'], quota=user['quota'], percent=user['percent'])
    attention.sort(key=lambda each: each['level'] != 'critical')
    for volume in volumes:
        if volume['grown_by']:
            cause = volume['grown_by'][0]
            tell('ok', 'volume_grew_in', 'growth', volume=volume['path'], bytes=cause['bytes'] * 4 // 3,
                 date=model.now - 30 * DAY, place=cause['share'])
    tell('ok', 'share_largest', 'share_list', share=shares[0]['name'], bytes=shares[0]['bytes'])
    tell('ok', 'owner_most', 'file_owner', owner=owner_list[0]['name'], bytes=owner_list[0]['bytes'])
    if kind != 'tiny':
        tell('ok', 'duplicates_possible', 'duplicate_file', bytes=412 * GIB, groups=1873)
    tell('ok', 'data_oldest', 'least_modify', date=model.now - 5400 * DAY, file='minutes 2011/plan.dwg')
    incidents = [] if kind != 'damaged' else [
        {'level': 'error', 'kind': 'share_missing', 'what': 'Finance',
         'text': 'The folder /srv/home/Finance is not there: mount it, or remove the share from share.conf.'},
        {'level': 'warning', 'kind': 'share_part', 'what': 'Users: 17', 'text': 'Folders could not be read: permission denied.'},
        {'level': 'error', 'kind': 'report_failed', 'what': 'large_file', 'text': 'The rows of the report could not be written.'}]
    return {'format': 1, 'host': 'files', 'profile': 'weekly', 'time_zone': 'Europe/Berlin', 'language': 'en',
            'started': model.now - 1840, 'finished': model.now, 'complete': kind != 'damaged', 'incidents': incidents,
            'volumes': volumes, 'shares': shares, 'owners': owner_list, 'types': type_list, 'ages': ages,
            'quotas': quotas, 'duplicates': {'mode': 'name', 'groups': 1873, 'files': 4201,
                                             'reclaimable': 412 * GIB if kind != 'tiny' else 0},
            'attention': attention, 'reports': []}


def blocks_of(model, facts):
    """Each report's block: name, text behind `var NAME = `, rows in all."""
    few = len(facts['shares']) < 2
    choice = model.choice

    def files(count, size, days):
        return [(share, model.file(share), size(i), int(model.now - days(i) * DAY)) for i, share in enumerate(
            choice.choices([share['name'] for share in facts['shares']], k=8 if few else count))]
    large = files(200, lambda i: int(900 * GIB * .96 ** i), lambda i: choice.expovariate(.004))
    old = files(200, lambda i: int(choice.paretovariate(.5) * (1 << 20)) % (300 * GIB), lambda i: 5400 - i * 9)
    new = files(200, lambda i: int(choice.paretovariate(.6) * (1 << 18)) % (80 * GIB), lambda i: i * .03)
    groups = [(str(n + 1), share, f'{Path(path).parent}/{where}{Path(path).name}', size // 40, time_)
              for n, (share, path, size, time_) in enumerate(large[:200]) for where in ('', 'copy/', 'old/')[:2 + n % 2]]
    changes = []
    for since in ('last', 'week', 'month') if model.has_history else ():
        for kind, key, source in (('share', 'name', 'shares'), ('owner', 'name', 'owners'), ('type', 'type', 'types')):
            changes += [(since, kind, '' if kind != 'share' else each[key], '' if kind == 'share' else each[key],
                         each['grown'][since]['files'], each['grown'][since]['bytes']) for each in facts[source]]
        part = {'last': 30, 'week': 4, 'month': 1}[since]
        changes += [(since, 'folder', share, folder, files_ // 9, int(bytes_ * choice.uniform(-.03, .09)) // part)
                    for share, folder, bytes_, files_, _ in model.folders[:60] if folder != '.']
    ages = [(share['name'], age, share['files'] // 7, int(share['bytes'] * part)) for share in facts['shares'] for age, part in
            zip(AGES, sorted((.04, .09, .14, .24, .27, .14, .08), key=lambda _: choice.random()))]
    quotas = {user['volume']: [f"['{one}', {choice.randrange(2) * 50 * GIB}, {choice.randrange(80 * GIB)}, {choice.randrange(120)}.0]"[1:-1].split(', ')
                               for one in model.people[:100]] for user in facts['quotas'][:1]}
    types = {'vornAll': [[quoted(each['type']), quoted(place['share']), str(place['bytes'])] for each in facts['types'] for place in each['shares']][:100],
             **{owner['name']: [[quoted(f'reportUI_file_type_{name}'), quoted(owner['places'][0]['share']), str(part)] for name, part in
                                model.parts(owner['bytes'], TYPES[:8])] for owner in facts['owners'][:len(PEOPLE)]}}
    return {
        'quota_usage': tables_of(quotas) if quotas else None,
        'file_owner': rows_of([(owner['name'], place['share'], place['files'], place['bytes']) for owner in facts['owners'] for place in owner['places']]),
        'volume_usage': rows_of([(v['id'], v['used'], v['free'], f"{v['percent']:.1f}%", v['forecast']['days'] or '') for v in facts['volumes']]),
        'share_list': rows_of([(share['name'], share['volume'], share['bytes']) for share in facts['shares']]),
        'file_group': tables_of(types), 'duplicate_file': None if few else rows_of(groups),
        'large_file': rows_of([row[:3] for row in large]), 'least_modify': rows_of(old), 'most_modify': rows_of(new),
        'folder_usage': rows_of(model.folders), 'file_age': rows_of(ages),
        'growth': rows_of(changes) if changes else None,
        'coverage': rows_of([(share['volume'], share['name'], share['files'], share['bytes'], share['allocated'], 0, 2) for share in facts['shares']])}


def write_page(folder, facts, blocks, build, language):
    formats = json.loads((build / 'report_format.json').read_text())
    for report in formats['reports']:
        text = blocks[report['name']] or ''
        shown = text.count('\n[')
        limit = report['page_limit'] or None
        facts['reports'].append({'name': report['name'], 'rows': 10000 if limit and shown >= limit else shown, 'shown': shown,
                                 'limit': limit, 'csv': f"csv/{report['name']}.csv" if report['has_csv_rows'] else None, 'ok': True})
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
        lines = json.dumps(facts).replace('<', '\\u003c')
        with head.open('a') as file:
            for report in formats['reports']:
                if blocks[report['name']]:
                    file.write(f"<script type='text/javascript'>\nvar {report['variable']} = {blocks[report['name']]}</script>\n")
            file.write(f"<script type='text/javascript'>\nvar {formats['facts_variable']} = {lines};\n</script>\n")
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
