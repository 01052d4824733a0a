"""Volume usage: measuring, the history over many runs, the estimate, page and CSV file."""
import json
import re
import time

from expected import MARK, SCRIPT, data_blocks
from harness import PROGRAM, ProductTest

MIB = 1 << 20
FILL = 3 * MIB
SAME_31 = '/tmp/volumes-with-one-beginning'  # 31 bytes: what the history keeps of a path
VOLUMES = ['/tmp/grow', '/tmp/slow', '/tmp/shrink', '/tmp/clock', '/tmp/now',
           '/tmp/archive-of-2023', SAME_31 + '-and-a', SAME_31 + '-and-b']


class Volumes(ProductTest):
    def new_machine(self):
        machine = super().new_machine()
        for i, path in enumerate(VOLUMES):
            machine.options += ['--tmpfs', 8 * MIB, path]
            machine.share(f'share{i}', path, inside=True)
        return machine

    def dates(self):
        return {int(date) for date, in self.m.history('SELECT sampleDate FROM VolumeUsage')}

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
        self.m.samples([(profile, '/some', 1, 2, '33.3333', 1_500_000_000 + 3600 * i)
                        for i in range(1010) for profile in ('global', 'p1')])
        self.m.profile('p1', report_list='volume_usage')
        for profile, status in (('p1', 'success'), ('global', 'collect_data')):
            with self.subTest(profile):
                time.sleep(1.1)  # for a date of its own
                before = self.dates()
                run = self.run_program('--data', profile)
                self.assertEqual((run.log_lines, self.m.status(profile)), ([], status))
                new, = self.dates() - before
                dates = sorted(before | {new}, reverse=True)
                self.assertEqual(self.dates(), set(dates) - set(dates[1000:1005]))
                rows = self.m.history('SELECT volume, sizeUse, sizeFree, percent, profile FROM '
                                      f'VolumeUsage WHERE sampleDate = {new}')
                self.assertEqual({row[4] for row in rows}, {profile})
                self.assertMeasured([(row[0], int(row[1]), int(row[2]), row[3]) for row in rows])
                self.assertEqual(len({row[0] for row in rows}), len(rows) - 1)  # the two of 31
        self.assertEqual(len(before), 1011 - 5)

    def test_usage_history_and_estimate(self):
        for setting in ('yes', 'TRUE'):
            with self.subTest(setting):
                self.m = self.new_machine()
                self.check_report(setting)

    def check_report(self, setting):
        def sample(volume, used, date, profile='global'):
            return (profile, volume, used, 8 * MIB - used, '%.4f' % (used / 8 / MIB), date)
        start, recently = 1_700_000_000, int(time.time()) - 1000
        self.m.samples([
            sample('/tmp/grow', 5 * MIB, recently),  # more than now: passed over
            sample('/tmp/grow', 0, recently - 600_000), sample('/tmp/grow', 2 * MIB, start),
            sample('/tmp/grow', 0, start + 8, 'p1'),  # another profile's
            sample('/tmp/slow', FILL + 4095, recently),  # less than a byte a second
            sample('/tmp/slow', 4096, recently - 1_500_000),
            sample('/gone', MIB, start), sample('/gone', 0, start + 1),
            sample('/tmp/shrink', 7 * MIB, start), sample('/tmp/clock', 0, 2_100_000_000),
            sample(SAME_31, 1, start), sample("/it's gone", 2 * MIB, start + 2)])
        self.m.profile('p1', report_list='volume_usage', volume_history=setting)
        run = self.run_program('--report', 'p1')
        history = setting == 'TRUE'  # and nothing else
        lines = [line for line in run.log_lines if '31 bytes in common' not in line]
        self.assertEqual((len(lines), len(run.log_lines)), (2 * 3, 7) if history else (0, 1))
        for line in lines:  # of each block and stored sample of no volume
            self.assertRegex(line, '^src/rep_volume_usage.*get volume id failed, volume=\\s*$')

        folder = self.m.report_folders('p1')[-1]
        first, *rest = data_blocks(folder).split(b'</script>\n')[:-1]
        inside = re.fullmatch(re.escape(SCRIPT) + rb'var vornVolumeUsageData = \[\n(.*?)\n\];\n',
                              first, re.DOTALL)[1].decode()
        rows = [re.fullmatch(r"\[ '([^']+)', (\d+) , (\d+), '([\d.]{7})%', '(\d+)' \]",
                             row).groups() for row in inside.split(',\n')]
        rows = [(name, int(used), int(free), *row) for name, used, free, *row in rows]
        self.assertEqual([row[0] for row in rows if row[0].startswith('/tmp/')],
                         VOLUMES[:-2] + [SAME_31 + '...'] * 2)
        self.assertMeasured([(row[0].replace('...', ''), *row[1:4]) for row in rows])
        # Growth of 5 and of 2 bytes a second, into 5 MiB.
        self.assertEqual({row[0]: row[4] for row in rows if row[4] != '0'},
                         {'/tmp/grow': '12', '/tmp/slow': '30'} if history else {})

        known = self.m.history('SELECT volume, sampleDate, sizeUse, percent FROM VolumeUsage '
                               'WHERE profile = "global" ORDER BY sampleDate') if history else []
        clocks = [re.search(rb"' : \[\n\[ '(\d+)'", part)[1].decode()
                  for part in rest[0].split(b'\n]')[:-1]] if history else [''] * len(rows)
        series, csv_lines, named = [], [], set()
        for (name, used, free, percent, days), clock in zip(rows, clocks):
            path = name.replace('...', '')
            # Of two volumes of one name the first has all their samples.
            points = [(clock, percent), *((row[1], row[3]) for row in known[::-1]
                                          if row[0] == path and path not in named)]
            named.add(path)
            series.append(f"'{name}' : [\n" +
                          ',\n'.join(f"[ '{at}', {value} ]" for at, value in points) + '\n]')
            csv_lines.append(f'"{path}", "{used + free}" ,"{percent}%", "{days}"\n')
        whole = SCRIPT.decode() + 'var vornVolumeUsageDataHistory = {\n' + ',\n'.join(series)
        self.assertEqual(b''.join(rest).decode(), (whole + '\n};\n') if history else '')
        csv_lines += [f'"", "{8 * MIB}" ,"{row[3]}%", "-"\n' for row in known
                      if row[0] not in named]
        self.assertEqual((folder / 'csv/volume_usage.csv').read_bytes(),
                         MARK + b'Volume, Size, Used, Daty to Full\n' +
                         ''.join(csv_lines).encode())
