"""Quota usage: the real tool on a real file system with quotas, and tools that misbehave."""
import os
import re
import struct
import subprocess
import unittest

from expected import SCRIPT, data_blocks, needs_root
from harness import PROGRAM, ProductTest

ACCOUNTS = {'root': 0, 'ann': 3001, 'bob': 3002, 'carl': 3003, 'john-doe': 3004}
UNKNOWN = 3999
REPQUOTA = os.path.realpath('/sbin/repquota')


def parse(output):
    """[(name, used, quota, whether the line was complete)] of the tool's output."""
    lines = iter(output.splitlines())
    for line in lines:
        if line.startswith('-'):
            break
    rows = [(line.split(), line) for line in lines]
    return [(row[0], int(row[2]), int(row[3]) if len(row) > 4 else 0, len(row) > 4)
            for row, _ in rows if len(row) > 3]


def divide(numerator, denominator):
    """As C does and prints it."""
    if denominator:
        return '%f' % (numerator / denominator)
    return 'inf' if numerator else '-nan'


def blocks(name, rows, total_kib, accounts):
    """The two blocks of a volume."""
    most_quota = most_used = 0
    for user, used, quota, complete in rows:
        if complete:
            most_quota = max(most_quota, quota) if quota else total_kib
            most_used = max(most_used, used) if user in accounts else most_used
    shown = sorted((row for row in rows if row[0] in accounts), key=lambda row: row[1])[:100]

    def percent(used, quota):
        single = struct.unpack('f', struct.pack('f', used))[0]
        return '%.1f' % (single * 100.0 / quota if quota else -1.0)
    raw = ',\n'.join(f'[[0, {i}, {divide(float(row[1] * 100), float(most_used))}]]'
                     for i, row in enumerate(shown))
    labels = '\t\t,\n'.join(f"\t\t'{row[0]}'\n" for row in shown)
    table = ',\n'.join(f"['{user}', {quota * 1024}, {used * 1024}, {percent(used, quota)}]"
                       for user, used, quota, _ in shown)
    return SCRIPT + (
        f"var vornQuotaUsageData = {{\n'{name}' : {{\n\tmaxQuota : '{most_quota}',\n"
        f"\tmaxUserUsed: {most_used},\n\tdata: [],\n\traw : [\n{raw}\n],\n"
        f"\tlabels : [\n{labels}\t]\n}}}}\n</script>\n").encode() + SCRIPT + (
        f"var vornQuotaUsageTable = {{\n'{name}' : [\n{table}]}}\n</script>\n").encode()


class QuotaTest(ProductTest):
    def setUp(self):
        super().setUp()
        self.accounts(ACCOUNTS)
        self.m.profile('q', report_list='quota_usage')

    def accounts(self, accounts):
        passwd = self.m.base / 'passwd'
        passwd.write_text(''.join(f'{name}:x:{uid}:0::/:\n' for name, uid in accounts.items()))
        self.m.options += ['--bind', passwd, '/etc/passwd']

    def share_on(self, volume):
        with self.m.shares.open('a') as file:
            file.write(f'[quotas]\npath = {volume}\n')

    def report_and(self, script):
        """Runs the report and, in the same place, a script; (run, the page's data, its output)."""
        run = self.m.shell(f'{PROGRAM} --report q\necho "<<<"\n{script}')
        self.assertEqual((run.status, self.m.status('q')), (0, 'success'), run.err)
        self.assertEqual(self.m.leftovers(), [])
        return run, data_blocks(self.m.report_folders('q')[-1]), run.out.split('<<<\n')[1]


@needs_root
class RealTool(QuotaTest):
    def setUp(self):
        super().setUp()
        self.volume = self.m.base / 'volume'
        self.volume.mkdir()
        image = self.m.base / 'image'
        with image.open('wb') as file:
            file.truncate(16 << 20)
        self.call('mkfs.ext4', '-q', '-O', '^quota', image)
        self.call('mount', '-o', 'loop,usrquota', image, self.volume)
        self.addCleanup(self.call, 'umount', self.volume)
        # The tool looks at the device, which the sandbox's own /dev lacks.
        device = subprocess.check_output(['findmnt', '-n', '-o', 'SOURCE', self.volume], text=True)
        self.m.options += ['--bind', device.strip(), device.strip()]
        self.share_on(self.volume)

    def call(self, *command):
        subprocess.run(list(map(str, command)), check=True, stderr=subprocess.DEVNULL)

    def use(self, uid, kib):
        path = self.volume / f'file{uid}'
        path.write_bytes(b'x' * (kib << 10))
        os.chown(path, uid, -1)

    def test_users_under_at_and_without_a_quota(self):
        for uid, kib in ((3001, 600), (3002, 500), (3003, 700), (3004, 400), (UNKNOWN, 900)):
            self.use(uid, kib)
        self.call('sync', '-f', self.volume)
        self.call('quotacheck', '-cum', self.volume)
        for uid, soft in ((3001, 1000), (3002, 500), (3003, 650), (UNKNOWN, 1200)):
            self.call('setquota', '-u', str(uid), soft, 2 * soft, 0, 0, self.volume)
        run, data, output = self.report_and(f"stat -f -c '%S %b %f %a' {self.volume}\n"
                                            f'/sbin/repquota {self.volume}')
        size, output = output.split('\n', 1)
        block, blocks_, free, available = map(int, size.split())
        rows = parse(output)
        self.assertEqual({row[:3] for row in rows if row[0] != 'root'}, {
            ('ann', 600, 1000), ('bob', 500, 500), ('carl', 700, 650), ('john-doe', 400, 0),
            (f'#{UNKNOWN}', 900, 1200)})
        total = (blocks_ - free + available) * block // 1024
        self.assertEqual(data, blocks(self.volume, rows, total, ACCOUNTS))
        # Other volumes have none, and that is all there is to say.
        for line in run.log_lines:
            self.assertRegex(line, r'^src/rep_quota_usage:\d+ .*volume=/.* get quota failed\s*$')


class BadTool(QuotaTest):
    VOLUME = '/tmp/quotas'
    TOTAL = 4 << 10
    HEAD = '*** Report for user quotas\nUser used soft hard\n----------\n'

    def setUp(self):
        super().setUp()
        self.assertTrue(os.path.exists(REPQUOTA), 'install the package quota')
        self.share_on(self.VOLUME)
        self.tool = self.m.base / 'repquota'
        self.m.options += ['--tmpfs', self.TOTAL << 10, self.VOLUME, '--bind', self.tool, REPQUOTA]

    def report_with(self, script):
        self.tool.write_text(f'#!/bin/sh\n[ "$1" = {self.VOLUME} ] || exit 1\n{script}\n')
        self.tool.chmod(0o755)
        run, data, _ = self.report_and('')
        lines = [line for line in run.log_lines if 'volume=/ ' not in line]
        return data, ''.join(line for line in lines if re.search(f'volume={self.VOLUME}|parsing|'
                                                                  'QuotaUsage|too much', line))

    def cat(self, text):
        output = self.m.base / 'output'
        output.write_bytes(text if isinstance(text, bytes) else text.encode())
        self.m.options += ['--bind', output, '/tmp/output'] if '/tmp/output' not in \
            self.m.options else []
        return 'cat /tmp/output'

    def test_odd_output(self):
        users = ''.join(f'{name} -- {used} {soft} 0 0 0 0 0\n' for name, used, soft in (
            ('ann', 5, 0), ('bob', 5, 9), ('root', 1 << 53, 1 << 40), ('x' * 9999, 1, 1)))
        for name, text, failure in (
                ('no dashes', 'a title\n' + users.replace('-', '+'), 'parsing command failed'),
                ('nothing', '', 'parsing command failed'),
                ('only a head', self.HEAD, 'parsing command failed'),
                ('short lines', self.HEAD + '\nann\nann --\nann -- 5\nbob -- 7 20\n'
                 '   carl  --   8   30  0\n \n', ''),
                ('last line without end', self.HEAD + users + 'carl -- 3 4 5', ''),
                ('only users that nobody knows', self.HEAD + 'none -- 3 4 5\n', ''),
                ('nothing used', self.HEAD + 'ann -- 0 4 5\n', ''),
                ('many', self.HEAD + ''.join(
                    f'#{i} -- {i} 10 20\n' for i in range(200_000)) + users, '')):
            with self.subTest(name):
                data, log = self.report_with(self.cat(text))
                self.assertEqual(data, blocks(self.VOLUME, parse(text), self.TOTAL, ACCOUNTS))
                self.assertEqual((failure in log, log == ''), (True, failure == ''), log)

    def test_the_hundred_smallest(self):
        accounts = {f'u{i:03}': 4000 + i for i in range(150)}
        self.accounts(accounts)
        text = self.HEAD + ''.join(f'u{i:03} -- {i * 37 % 50} {i % 3 * 100} 0\n'
                                   for i in range(150))
        data, log = self.report_with(self.cat(text))
        self.assertEqual((data, log),
                         (blocks(self.VOLUME, parse(text), self.TOTAL, accounts), ''))

    def test_the_report_goes_on(self):
        for name, script, message in (
                ('fails', 'echo no; exit 3', 'get quota failed'),
                ('is killed', 'kill -9 $$', 'get quota failed'),
                # The first of its two runs is for the exit status only.
                ('prints without end', '[ -e /tmp/ran ] && exec yes; touch /tmp/ran',
                 'command printed too much'),
                ('binary', self.cat(self.HEAD.encode() + bytes(range(256)) * 4000), '')):
            with self.subTest(name):
                data, log = self.report_with(script)
                self.assertIn(message, log)
                self.assertEqual(b'vornQuotaUsageTable' in data, message == '')


if __name__ == '__main__':
    unittest.main()
