"""Volume usage: measuring, the history over many runs, the estimate, page and CSV file."""
import json
import re
import sqlite3
import time
import unittest

from expected import MARK, SCRIPT, data_blocks
from harness import PROGRAM, ProductTest

MIB = 1 << 20
FILL = 3 * MIB
SAME_31 = '/tmp/volumes-with-one-beginning'  # 31 bytes: what the history keeps of a path
VOLUMES = ['/tmp/grow', '/tmp/slow', '/tmp/shrink', '/tmp/clock', '/tmp/now',
           '/tmp/archive-of-2023', '/tmp/archive-of-2024', SAME_31 + '-and-a', SAME_31 + '-and-b']
INSERT = 'INSERT INTO VolumeUsage VALUES (?, ?, ?, ?, ?, ?)'
CSV_HEADER = MARK + b'Volume, Size, Used, Daty to Full\n'
U64 = 1 << 64


def estimate(now, then):
    """Days to full from the newest stored sample that tells; each sample is (date, used, free)."""
    for date, used, _ in then:
        interval = now[0] - date
        if now[1] <= used or interval == 0:
            continue
        speed = (now[1] - used) // (interval % U64)
        if speed > 0:
            return now[2] // (speed * 86400 % U64)
    return 0


class Volumes(ProductTest):
    def setUp(self):
        super().setUp()
        for i, path in enumerate(VOLUMES):
            self.m.options += ['--tmpfs', 8 * MIB, path]
            with self.m.shares.open('a') as file:  # the folder is there in the sandbox only
                file.write(f'[share{i}]\npath = {path}\n')
        self.database = self.m.vorn / 'etc/vornreport.db'

    def store(self, rows):
        schema = (self.m.vorn / 'vornreport/sql/vornreport.sql').read_text()
        with sqlite3.connect(self.database) as db:
            db.executescript(schema)
            db.executemany(INSERT, [tuple(map(str, row)) for row in rows])
        db.close()

    def stored(self, *columns, where='1'):
        with sqlite3.connect(self.database) as db:
            rows = db.execute(f'SELECT {", ".join(columns)} FROM VolumeUsage WHERE {where} '
                              'ORDER BY rowid').fetchall()
        db.close()
        return rows

    def run_program(self, *arguments):
        """Fills the volumes, runs the program, and measures the volumes in the same place."""
        measure = ('import json, os, sys; print("measured", '
                   'json.dumps({path: list(os.statvfs(path)) for path in sys.argv[1:]}))')
        run = self.m.shell(
            ''.join(f'head -c {FILL + i * 4096} /dev/zero >{path}/file\n'
                    for i, path in enumerate(VOLUMES))
            + f'{PROGRAM} {" ".join(arguments)}\n'
            f'/usr/bin/python3 -c \'{measure}\' / {" ".join(VOLUMES)}')
        self.assertEqual((run.status, run.err), (0, ''))
        sizes = json.loads(re.search(r'^measured (.*)$', run.out, re.MULTILINE)[1])
        # As df does: what is used and what a user may still use.
        self.measured = {path: ((size[2] - size[3]) * size[1], size[4] * size[1])
                         for path, size in sizes.items()}
        return run

    def current(self, blocks):
        """{identifier: (used, free, percent, days)} of the block of the current usage."""
        inside = re.search(re.escape(SCRIPT) + rb'var vornVolumeUsageData = \[\n(.*?)\n\];\n'
                           rb'</script>\n', blocks, re.DOTALL)[1].decode()
        rows = [re.fullmatch(r"\[ '([^']+)', (\d+) , (\d+), '([\d.]{7})%', '(-|\d+)' \]",
                             row).groups() for row in inside.split(',\n')]
        return [(name, int(used), int(free), percent, days)
                for name, used, free, percent, days in rows]

    def assertMeasured(self, rows):
        """`rows` of path, used, free and percent are the volumes as they are."""
        found = {row[0]: row for row in rows}
        for path, (used, free) in self.measured.items():
            row = found[path[:31]]
            if path == '/':  # others write there
                self.assertEqual(row[1] + row[2], used + free)
            elif not path.startswith(SAME_31):
                self.assertEqual(row[1:3], (used, free), path)
        for row in rows:
            self.assertEqual(row[3], ('%f' % (row[1] * 100.0 / (row[1] + row[2])))[:7])

    def test_collection_and_rotation(self):
        self.store((profile, '/some', 1, 2, '33.3333', 1_500_000_000 + 3600 * i)
                   for i in range(1010) for profile in ('global', 'p1'))
        self.m.profile('p1', report_list='volume_usage')
        for profile, status in (('p1', 'success'), ('global', 'collect_data')):
            with self.subTest(profile):
                time.sleep(1.1)  # for a date of its own
                before = {int(date) for date, in self.stored('DISTINCT sampleDate')}
                run = self.run_program('--data', profile)
                self.assertEqual((run.log_lines, self.m.status(profile)), ([], status))
                after = {int(date) for date, in self.stored('DISTINCT sampleDate')}
                new = after - before
                self.assertEqual(len(new), 1)
                dates = sorted(before | new, reverse=True)
                self.assertEqual(after, set(dates) - set(dates[1000:1005]))
                rows = self.stored('volume', 'sizeUse', 'sizeFree', 'percent', 'profile',
                                   where=f'sampleDate = {min(new)}')
                self.assertEqual({row[4] for row in rows}, {profile})
                self.assertMeasured([(row[0], int(row[1]), int(row[2]), row[3]) for row in rows])
                self.assertEqual(len({row[0] for row in rows}), len(rows) - 1)  # the two of 31
        self.assertEqual(len(before), 1011 - 5)

    def test_current_usage_without_history(self):
        self.store([('global', '/tmp/grow', 0, 9, '00.0000', 1_600_000_000)])
        self.m.profile('p1', report_list='volume_usage', volume_history='yes')
        run = self.run_program('--report', 'p1')
        self.assertEqual(len(run.log_lines), 1, run.log_lines)
        self.assertIn('have the first 31 bytes in common', run.log_lines[0])
        folder = self.m.report_folders('p1')[-1]
        blocks = data_blocks(folder)
        self.assertNotIn(b'vornVolumeUsageDataHistory', blocks)
        rows = self.current(blocks)
        names = [row[0] for row in rows]
        self.assertEqual([name for name in names if name.startswith('/tmp/')],
                         VOLUMES[:-2] + [SAME_31 + '...'] * 2)
        self.assertMeasured([(row[0].replace('...', ''), *row[1:]) for row in rows])
        self.assertEqual({row[4] for row in rows}, {'0'})
        self.assertEqual((folder / 'csv/volume_usage.csv').read_bytes(), CSV_HEADER + b''.join(
            b'"%s", "%d" ,"%s%%", "0"\n' % (name.replace('...', '').encode(), used + free,
                                            percent.encode())
            for name, used, free, percent, _ in rows))

    def test_history_and_estimate(self):
        def sample(volume, used, date, profile='global'):
            return (profile, volume, used, 8 * MIB - used, '%.4f' % (used / 8 / MIB), date)
        start, recently = 1_700_000_000, int(time.time()) - 1000
        self.store([
            sample('/tmp/grow', 5 * MIB, start + 9),  # more than now: passed over
            sample('/tmp/grow', 1 * MIB, start + 5), sample('/tmp/grow', 2 * MIB, start + 7),
            sample('/tmp/grow', 0, start + 8, 'p1'),  # another profile's
            sample('/tmp/slow', FILL + 4095, recently),  # less than a byte a second
            sample('/tmp/slow', 4096, recently - 1_500_000),
            sample('/gone', MIB, start), sample('/gone', 0, start + 1),
            sample('/tmp/shrink', 7 * MIB, start), sample('/tmp/clock', 0, 2_100_000_000),
            sample(SAME_31, 1, start), sample("/it's gone", 2 * MIB, start + 2)])
        self.m.profile('p1', report_list='volume_usage', volume_history='TRUE')
        run = self.run_program('--report', 'p1')
        gone = ['src/rep_volume_usage', 'get volume id failed, volume=']
        lines = [line for line in run.log_lines if '31 bytes in common' not in line]
        self.assertEqual(len(lines), 2 * 3)  # of each block and stored sample of no volume
        for line in lines:
            self.assertTrue(line.startswith(gone[0]) and line.rstrip().endswith(gone[1]), line)

        folder = self.m.report_folders('p1')[-1]
        blocks = data_blocks(folder)
        rows = self.current(blocks)
        history = blocks.split(b'vornVolumeUsageDataHistory')[1].decode()
        clocks = re.findall(r"'([^']+)' : \[\n\[ '(\d+)'", history)
        self.assertEqual([name for name, _ in clocks], [row[0] for row in rows])
        known = self.stored('volume', 'sampleDate', 'sizeUse', 'sizeFree', 'percent',
                            where='profile = "global"')
        known.sort(key=lambda row: row[1])
        series, csv_lines, named = [], [], set()
        for (name, used, free, percent, days), (_, date) in zip(rows, clocks):
            path = name.replace('...', '')
            # Of two volumes of one name the first has all their samples.
            stored = [row for row in known[::-1] if row[0] == path and path not in named]
            named.add(path)
            with self.subTest(name):
                self.assertEqual(days, str(estimate(
                    (int(date), used, free), [(int(row[1]), int(row[2]), 0) for row in stored])))
            points = [(date, percent), *((row[1], row[4]) for row in stored)]
            series.append(f"'{name}' : [\n" +
                          ',\n'.join(f"[ '{at}', {value} ]" for at, value in points) + '\n]')
            csv_lines.append(f'"{path}", "{used + free}" ,"{percent}%", "{days}"\n')
        self.assertEqual(history, ' = {\n' + ',\n'.join(series) + '\n};\n</script>\n')
        csv_lines += [f'"", "{8 * MIB}" ,"{row[4]}%", "-"\n' for row in known
                      if row[0] not in named]
        self.assertEqual((folder / 'csv/volume_usage.csv').read_bytes(),
                         CSV_HEADER + ''.join(csv_lines).encode())
        # The cases above are the ones that they are meant to be.
        days = {row[0]: int(row[4]) for row in rows}
        self.assertGreater(days['/tmp/slow'], 10)
        self.assertEqual([days[path] for path in ('/tmp/shrink', '/tmp/clock', '/tmp/now')],
                         [0, 0, 0])
        self.assertIn(')ullSpeed=0, check next\n', run.out)


if __name__ == '__main__':
    unittest.main()
