"""What has grown: snapshots of earlier runs against walks of our own before and after."""
import collections
import os
import shutil
import signal
import sqlite3
import time

from expected import block, csv, data_blocks, facts
from harness import ProductTest, make_files

DAY = 86400
LIST = 'file_owner,file_group,growth'
HEADER = 'Since\tKind\tShare\tName\tFile Count\tSize(Byte)'
KINDS = ('share', 'owner', 'type', 'folder')
ODD = "o'dd \\ \t<b>\n\udcff"


class Growth(ProductTest):
    def setUp(self):
        super().setUp()
        self.accounts = {'root': 0, 'anna': 3001, 'bjoern': 3002}
        self.m.accounts(self.accounts)
        self.top = self.m.base / 'srv'
        self.shares = {name: self.m.share(name, self.top / name) for name in ('one', 'two')}
        self.m.profile('p', report_list=LIST)

    def times(self, condition='1'):
        return [time for time, in self.m.history(
            f'SELECT time FROM Snapshot WHERE {condition} ORDER BY time')]

    def sums(self):
        """Files and bytes by kind, share and name."""
        names = {uid: name for name, uid in self.accounts.items()}
        sums = collections.defaultdict(lambda: [0, 0])
        for share, top in self.shares.items():
            for path, folders, files in os.walk(top):
                below = os.path.relpath(path, top)
                parts = [] if below == '.' else below.split('/')
                above = ['.'] + ['/'.join(parts[:i + 1]) for i in range(len(parts))]
                for folder in above:
                    sums['folder', share, folder][0] += 0
                for name in files:
                    status = os.lstat(os.path.join(path, name))
                    kind = 'reportUI_file_type_' + ('image' if name.endswith('.jpg') else 'other')
                    for key in (('share', share, ''), ('type', share, kind),
                                ('owner', share, names[status.st_uid]),
                                *(('folder', share, folder) for folder in above)):
                        sums[key][0] += 1
                        sums[key][1] += status.st_size
        return {key: tuple(sum_) for key, sum_ in sums.items()}

    def rows(self, bases, now):
        """The changes in shares that were there at both times."""
        rows = []
        for since, then in bases:
            both = {key[1] for key in then} & {key[1] for key in now}
            changes = [(*key, *(b - a for a, b in zip(then.get(key, (0, 0)), now.get(key, (0, 0)))))
                       for key in then.keys() | now.keys() if key[1] in both]
            rows += sorted(((since, *row) for row in changes if any(row[3:])), key=lambda row: (
                KINDS.index(row[1]), -abs(row[5]), -abs(row[4]), os.fsencode(row[2]),
                os.fsencode(row[3])))
        return rows

    def report(self, bases, log='', err=''):
        """Runs the report, whose rows must be the changes since `bases`; its facts."""
        time.sleep(1.1)  # its folder and snapshot are called by the second
        run = self.m.run('--report', 'p')
        self.assertRegex(''.join(run.log_lines), f'^{log}\n*$')
        run.log_lines = []
        self.assertSucceeded(run, 'p', err)
        folder = self.m.report_folders('p')[-1]
        now = self.sums()
        rows = self.rows(bases, now)
        self.assertEqual((folder / 'csv/growth.csv').read_bytes(), csv(HEADER, rows))
        self.assertTrue(data_blocks(folder).endswith(block('vornGrowthData', rows)))
        self.assertEqual(self.times('valid = 0'), [])
        return facts(folder), now

    def test_three_runs(self):
        make_files(self.top / 'one', {'stays': 10, 'a/b/grows.jpg': 100, 'a/goes': 1000,
                                      f'{ODD}/{ODD}': 7, 'moves/x/1': 50, 'moves/x/2': 51})
        make_files(self.top / 'two', {'deep/1': 20})
        os.chown(self.top / 'one/a/b/grows.jpg', 3001, -1)
        found, first = self.report([])
        self.assertEqual(found['shares'][0]['grown'], {'last': None, 'week': None, 'month': None})
        self.assertEqual({volume['grown_by'] and 0 for volume in found['volumes']}, {None})
        self.m.history('UPDATE Snapshot SET time = time - ?', 33 * DAY)

        os.rename(self.top / 'one/moves/x', self.top / 'two/x')
        make_files(self.top / 'one', {'a/b/grows.jpg': 400, f'{ODD}/new': 0})
        found, second = self.report([('last', first), ('month', first)])
        self.m.history('UPDATE Snapshot SET time = time - ? WHERE time > ?', 8 * DAY,
                       self.times()[0])

        (self.top / 'one/a/goes').unlink()
        shutil.rmtree(self.top / 'two/deep')
        make_files(self.top / 'one', {'a/b/more.jpg': 5000})
        os.chown(self.top / 'one/a/b/more.jpg', 3001, -1)
        found, third = self.report([('last', second), ('week', second), ('month', first)])
        share = next(share for share in found['shares'] if share['name'] == 'one')
        old, recent, _ = self.times()
        total, before = third['share', 'one', ''], first['share', 'one', '']
        self.assertEqual(share['grown']['month'], {'since': old, 'files': total[0] - before[0],
                                                   'bytes': total[1] - before[1]})
        self.assertEqual(share['samples'], [[old, before[1]], [recent, second['share', 'one', ''][1]],
                                            [found['started'], total[1]]])
        anna = next(owner for owner in found['owners'] if owner['name'] == 'anna')
        self.assertEqual(anna['grown']['week'], {'since': recent, 'files': 1, 'bytes': 5000})
        grown = next(volume['grown_by'] for volume in found['volumes'] if volume['grown_by'])
        self.assertEqual({(cause['kind'], cause['name']): cause['bytes'] for cause in grown}[
            'folder', 'a/b'], 5300)
        said = [entry for entry in found['attention'] if entry['code'] == 'volume_grew_in_by']
        self.assertEqual([(entry['values']['place'], entry['values']['owner']) for entry in said],
                         [('one/a/b', 'anna')])

        # Who may no longer be told of, or is gone, isn't told of by an older set either.
        passwd = self.m.base / 'passwd'
        for file, text in ((passwd, passwd.read_text().replace('anna:x:3001:0::/:/bin/sh\n', '')),
                           (passwd, passwd.read_text()),
                           (self.m.config, self.m.config.read_text() + 'limit_user = bjoern\n')):
            file.write_text(text)
            time.sleep(1.1)
            self.assertEqual(self.m.run('--report', 'p').status, 0)
            folder = self.m.report_folders('p')[-1]
            told = (folder / 'report.json').read_bytes() + (folder / 'csv/growth.csv').read_bytes()
            (details,), = self.m.history('SELECT details FROM Snapshot ORDER BY time DESC LIMIT 1')
            is_told = file == passwd and 'anna' in text
            self.assertEqual((b'anna' in told, 'anna' in details), (is_told, is_told))

    def test_shares_that_come_and_go_and_a_clock_set_back(self):
        long = 'n' * 255
        make_files(self.top / 'one', {'a/1': 10, f'{long}/{long}/x': 5, 'sparse': 1 << 40})
        make_files(self.top / 'two', {'2': 7})
        os.link(self.top / 'one/a/1', self.top / 'one/a/linked')
        _, first = self.report([])
        self.m.history('UPDATE Snapshot SET time = time - ?', 2 * DAY)
        # One share lies in the other from now on, and one is gone.
        before = self.m.shares.read_text()
        self.m.shares.write_text(before.split('[two]')[0])
        self.shares = {'one': self.top / 'one', 'inner': self.m.share('inner', self.top / 'one/a')}
        os.link(self.top / 'one/a/1', self.top / f'one/{long}/linked')
        make_files(self.top / 'one', {'sparse': 1 << 41, f'{long}/{long}/{long}': 6, 'a/new': 1})
        overlap = '.*shares inner and one hold the same files.*'
        found, _ = self.report([('last', first)], overlap, overlap + '\n')
        self.assertEqual([(each['kind'], each['what']) for each in found['incidents']],
                         [('share_overlap', 'inner, one')])
        # As if that report had been made tomorrow: it counts for nothing until then.
        self.m.history('UPDATE Snapshot SET time = time + ? WHERE time > ?', 2 * DAY, self.times()[0])
        self.m.shares.write_text(before)
        self.shares = {name: self.top / name for name in ('one', 'two')}
        (self.top / 'two/2').unlink()
        found, now = self.report([('last', first)])
        outer, = (volume for volume in found['volumes'] if volume['grown_by'])
        self.assertEqual({cause['bytes'] for cause in outer['grown_by'] if cause['kind'] == 'share'},
                         {now['share', 'one', ''][1] - first['share', 'one', ''][1]})

    def test_runs_that_leave_none(self):
        make_files(self.top / 'one', {'1': 1})
        # A database of before there were snapshots, with a sample in it.
        with sqlite3.connect(self.m.vorn / 'etc/vornreport.db') as db:
            db.executescript((self.m.vorn / 'vornreport/sql/vornreport.sql').read_text().split(
                '-- What finished')[0])
        db.close()
        _, before = self.report([])
        kept = self.times()
        make_files(self.top / 'one', {'2': 2})
        for is_killed in (False, True):
            with self.subTest(is_killed):
                time.sleep(1.1)
                self.m.stop_at('tail')
                run = self.m.start('--report', 'p')
                program, script = run.pid(), self.m.stopped_pid()
                self.assertEqual(len(self.times('valid = 0')), 1)
                os.kill(program if is_killed else script, signal.SIGKILL)
                self.m.go_on()
                run.finish()
                self.assertEqual((self.times('valid = 1'), len(self.times('valid = 0'))),
                                 (kept, int(is_killed)))
        self.report([('last', before)], err='.* did not finish: it was killed.*\n')
        self.assertEqual(len(self.times()), 2)
