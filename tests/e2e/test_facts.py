"""The facts of a run against independent counts, and of histories of each shape."""
import collections
import json
import os
import re
import subprocess
import time

from expected import facts, local_time
from harness import ALL, FORMAT, ProductTest, make_files, needs_loop_devices
from server import DAY, SHARES, USERS, Server

MIB = 1 << 20
AGES = '0-7 7-30 30-90 90-365 365-1095 1095-1825 1825- future'.split()


def age_of(seconds):
    days = seconds / DAY
    if days < -1:
        return 'future'
    return max((age for age in AGES[:-1] if int(age.split('-')[0]) <= max(days, 0)),
               key=lambda age: int(age.split('-')[0]))


def amounts(rows):
    """Key to [files, bytes] of rows of keys and sizes."""
    sums = collections.defaultdict(lambda: [0, 0])
    for key, size in rows:
        sums[key][0] += 1
        sums[key][1] += size
    return sums


@needs_loop_devices
class PreparedServer(ProductTest):
    """Four volumes, quotas and half a year of history."""

    def check_insight(self, report, found, shares, ages, below):
        def rows(name):
            lines = (report / f'csv/{name}.csv').read_bytes().split(b'\n')[1:-1]
            return [[field.strip(b'"').replace(b'""', b'"') for field in line.split(b'\t')]
                    for line in lines]

        def amount(sizes):
            return [b'%d' % len(sizes), b'%d' % sum(sizes)]
        self.assertEqual(sorted(rows('file_age')), sorted(
            [share.encode(), age.encode(), *amount(sizes)] for (share, age), sizes in ages.items()))
        total = {age: [sum(len(s) for (_, a), s in ages.items() if a == age),
                       sum(sum(s) for (_, a), s in ages.items() if a == age)] for age in AGES}
        self.assertEqual({age['age']: [age['files'], age['bytes']] for age in found['ages']}, total)
        self.assertEqual(sorted(rows('coverage')), sorted(
            [each['volume'].encode(), name.encode(),
             *(b'%d' % each[key] for key in ('files', 'bytes', 'allocated', 'unreadable', 'other'))]
            for name, each in shares.items()))
        for volume in found['volumes']:
            explained = sum(each['allocated'] for each in shares.values()
                            if each['volume'] == volume['path'])
            self.assertEqual((volume['explained'], volume['outside']),
                             (explained, volume['used'] - explained))
        folders = rows('folder_usage')
        self.assertEqual(sorted(folder[:4] for folder in folders), sorted(
            [share.encode(), way, *amount([size for size, _ in files])[::-1]]
            for (share, way), files in below.items()))
        sizes = [int(folder[2]) for folder in folders]
        self.assertEqual(sizes, sorted(sizes, reverse=True))
        for share, way, _, _, newest in folders:
            last = max([changed for _, changed in below[share.decode(), way]], default=0)
            self.assertEqual(newest.decode(), local_time(last))

    def test_facts_against_independent_counts(self):
        server = Server(self.m, self)
        server.history(days=180)
        users = {uid: name for name, uid in ({'root': 0} | USERS).items()}
        folder = server.root / 'projects/CAD'
        os.symlink('/etc/passwd', folder / 'link')
        os.mkfifo(folder / 'pipe')
        os.link(next(path for path in folder.rglob('*') if path.is_file() and not path.is_symlink()),
                folder / 'second name.iso')
        make_files(folder, {'@eaDir/left out': 5, 'sparse.bin': 1 << 40})
        stranger = folder / 'stranger'
        stranger.write_bytes(b'x' * 100)
        os.chown(stranger, 3999, -1)
        self.m.profile('p', report_list=ALL, limit_user='anna,bjoern,john-doe')
        before = int(time.time())
        run = self.m.run('--report', 'p')
        self.assertEqual((run.status, self.m.status('p')), (0, 'success'), run.log_lines)
        report = self.m.report_folders('p')[-1]
        found = facts(report)

        # What is in each share, by a walk of our own.
        shares, owners, types = {}, collections.defaultdict(list), collections.defaultdict(list)
        duplicates = collections.defaultdict(set)
        ages, below = collections.defaultdict(list), collections.defaultdict(list)
        for volume, names in SHARES.items():
            for share in names:
                top = server.root / volume / share
                count = {'name': share, 'path': f'/srv/{volume}/{share}', 'volume': f'/srv/{volume}',
                         'files': 0, 'folders': 0, 'bytes': 0, 'allocated': 0, 'unreadable': 0,
                         'other': 0, 'whole': True, 'index': False,
                         'grown': {'last': None, 'week': None, 'month': None}}
                for path, folders, files in os.walk(os.fsencode(top)):
                    folders[:] = [name for name in folders if name != b'@eaDir']
                    count['folders'] += len(folders)
                    inside = os.path.relpath(path, os.fsencode(top)).split(b'/')
                    ways = [b'.'] + [b'/'.join(inside[:n + 1]) for n in range(len(inside))
                                     if inside != [b'.']]
                    for way in ways:
                        below[share, way] += []
                    for name in files:
                        status = os.lstat(os.path.join(path, name))
                        if not os.path.isfile(os.path.join(path, name)) or os.path.islink(
                                os.path.join(path, name)):
                            count['other'] += 1
                            continue
                        count['files'] += 1
                        count['bytes'] += status.st_size
                        count['allocated'] += status.st_blocks * 512 // status.st_nlink
                        owners[users.get(status.st_uid)].append(((share, f'/srv/{volume}'),
                                                                 status.st_size))
                        types[share].append(status.st_size)
                        changed = int(status.st_mtime) % (1 << 32)
                        ages[share, age_of(found['started'] - changed)].append(status.st_size)
                        for way in ways:
                            below[share, way].append((status.st_size, changed))
                        duplicates[name, status.st_size].add((status.st_dev, status.st_ino))
                shares[share] = count
        for share in found['shares']:
            self.assertEqual(share.pop('samples'), [[found['started'], share['bytes']]])
        self.assertEqual({share['name']: share for share in found['shares']}, shares)
        self.assertEqual([share['bytes'] for share in found['shares']],
                         sorted((share['bytes'] for share in shares.values()), reverse=True))

        self.check_insight(report, found, shares, ages, below)

        # Owners: of the three that may be told of, wherever they have files.
        told = {'anna', 'bjoern', 'john-doe'}
        self.assertEqual({owner['name'] for owner in found['owners']}, told)
        for owner in found['owners']:
            places = amounts(owners[owner['name']])
            self.assertEqual({(place['share'], place['volume']): [place['files'], place['bytes']]
                              for place in owner['places']}, places)
            self.assertEqual([owner['files'], owner['bytes']],
                             [sum(column) for column in zip(*places.values())])
        told_types = {(kind['type'], part['share']): part['bytes']
                      for kind in found['types'] for part in kind['shares']}
        page = (report / 'report.html').read_text(errors='surrogateescape')
        block = page.split('var vornFileGroupTableData = {\nvornAll : [\n')[1].split(']\n,')[0]
        self.assertEqual(told_types, {(kind, share): int(size) for kind, share, size in re.findall(
            r"^\[ '(\w+)', '(.*)', (\d+) \]", block, re.MULTILINE)})
        for share, sizes in types.items():
            parts = [part for kind in found['types'] for part in kind['shares']
                     if part['share'] == share]
            self.assertEqual([sum(part['files'] for part in parts),
                              sum(part['bytes'] for part in parts)], [len(sizes), sum(sizes)])

        # Duplicates: names and sizes that several files have; a file of two names is one.
        groups = collections.Counter()
        rows = (report / 'csv/duplicate_file.csv').read_text(errors='replace').splitlines()[1:]
        numbers = {row.split('\t')[0] for row in rows}
        reclaimable = sum((len(inodes) - 1) * size
                          for (name, size), inodes in duplicates.items())
        self.assertEqual(found['duplicates']['reclaimable'], reclaimable)
        self.assertEqual(found['duplicates']['groups'], len(numbers))
        self.assertEqual(found['duplicates']['mode'], 'name')

        # Quotas, by the tool itself.
        table = subprocess.check_output(['repquota', server.root / 'home'], text=True,
                                        stderr=subprocess.DEVNULL)
        quotas = []
        for line in table.split('\n-', 1)[1].split('\n')[1:]:
            words = line.split()
            name = users.get(int(words[0][1:]), '') if words and words[0].startswith('#') else \
                words and words[0]
            if words and int(words[3]) and name in told:
                quotas.append(['/srv/home', name, int(words[2]) * 1024, int(words[3]) * 1024])
        quotas.sort(key=lambda row: -row[2] / row[3])
        self.assertEqual([[row[key] for key in ('volume', 'user', 'used', 'quota')]
                          for row in found['quotas']], quotas)
        self.assertEqual([row['level'] for row in found['quotas']],
                         ['critical' if used > quota else 'warning' if used >= .9 * quota else 'ok'
                          for _, _, used, quota in quotas])

        # Volumes, as df has them, with their samples.
        for volume in found['volumes']:
            if not volume['path'].startswith('/srv/'):
                continue
            status = os.statvfs(server.root / volume['path'][5:])
            used = (status.f_blocks - status.f_bfree) * status.f_frsize
            self.assertEqual((volume['used'], volume['free'], volume['size']),
                             (used, status.f_bavail * status.f_frsize,
                              used + status.f_bavail * status.f_frsize))
            self.assertAlmostEqual(volume['percent'], used * 100 / volume['size'])
            self.assertEqual(volume['samples'][-1][1], used)
            self.assertEqual(len(volume['samples']), 30)  # of every third day, and today's
        self.assertEqual(found['volumes'][0]['path'], '/srv/projects')
        self.assertEqual([found[key] for key in ('format', 'profile', 'complete', 'incidents')],
                         [1, 'p', True, []])
        self.assertTrue(before <= found['started'] <= found['finished'] <= time.time())
        self.assertEqual([entry['name'] for entry in found['reports']], ALL.split(','))
        large = next(entry for entry in found['reports'] if entry['name'] == 'large_file')
        self.assertEqual(large, {'name': 'large_file', 'rows': sum(s['files'] for s in shares.values()),
                                 'shown': 200, 'limit': 200, 'csv': 'csv/large_file.csv', 'ok': True})
        for entry in found['attention']:
            values = FORMAT['attention'][entry['code']]
            self.assertEqual((entry['section'], set(entry['values'])),
                             (values['section'], set(values['values'])))


# Name of a volume to what it is to show: how its history went (day before now to part of the
# present use), and how much of it is used now.
SHAPES = {
    'flat': ({day: 1 for day in range(1, 180)}, .60),
    'jump': ({day: .5 if day > 3 else 1 for day in range(1, 90)}, .60),
    'plateau': ({day: .7 + .3 * min(1, (160 - day) / 90) for day in range(1, 160)}, .60),
    'fresh': ({minute / 1440: 1 - minute / 100 for minute in range(3, 30, 3)}, .60),
    'grows': ({day: 1 - day / 100 for day in range(1, 40)}, .75),
    'full': ({day: 1 - day / 300 for day in range(1, 40)}, 1),
}
SIZE = 16 * MIB


class Shapes(ProductTest):
    """Histories that two samples alone would tell wrong."""

    def new_machine(self):
        machine = super().new_machine()
        for name in SHAPES:
            machine.options += ['--tmpfs', SIZE, f'/tmp/{name}']
            machine.share(name, f'/tmp/{name}', inside=True)
        return machine

    def prepare(self):
        now = int(time.time())
        rows = []
        for name, (parts, use) in SHAPES.items():
            for day, part in parts.items():
                used = int(SIZE * use * part)
                rows.append(('global', f'/tmp/{name}', used, SIZE - used, f'{used * 100 / SIZE:f}'[:7],
                             int(now - day * DAY)))
        # Two seconds ago there was a little less.
        used = int(SIZE * SHAPES['flat'][1]) - 500 * 1024
        rows.append(('global', '/tmp/flat', used, SIZE - used, '57.0000', now - 2))
        self.m.samples(rows)

    def test_each_shape_is_told_right(self):
        """By the facts and vornctl; that page and mail say the same is their tests' to see."""
        self.prepare()
        self.m.profile('p', report_list='volume_usage')
        fill = ''.join(f'head -c {int(SIZE * use)} /dev/zero >/tmp/{name}/file 2>/dev/null\n'
                       for name, (_, use) in SHAPES.items())
        run = self.m.shell(f'{fill}/usr/vorn/bin/vornreport --report p >&2; '
                           '/usr/vorn/bin/vornctl status --json p')
        found = facts(self.m.report_folders('p')[-1])
        volumes = {volume['path']: volume for volume in found['volumes']}
        self.assertEqual({name: (volumes[f'/tmp/{name}']['forecast']['state'],
                                 volumes[f'/tmp/{name}']['level']) for name in SHAPES},
                         {'flat': ('steady', 'ok'), 'jump': ('steady', 'ok'),
                          'plateau': ('steady', 'ok'), 'fresh': ('short', 'ok'),
                          'grows': ('growing', 'warning'), 'full': ('full', 'critical')})
        jump = volumes['/tmp/jump']['forecast']['jump']
        self.assertAlmostEqual(jump['bytes'], SIZE * .3, delta=MIB)
        self.assertEqual([entry['code'] for entry in found['attention']
                          if entry['values']['volume'].startswith('/tmp/')],
                         ['volume_full', 'volume_fills'])
        status, = json.loads(run.out)
        self.assertEqual(status['volume']['path'], '/tmp/full')
