"""Quota usage: the real tool on a real file system with quotas, and tools that misbehave."""
import os
import re
import struct

from expected import SCRIPT, data_blocks
from harness import (PROGRAM, ProductTest, call, mount_image, needs_loop_devices,
                     private_mounts)

ACCOUNTS = {'root': 0, 'ann': 3001, 'bob': 3002, 'carl': 3003, 'john-doe': 3004}
MANY = {f'u{i:03}': 4000 + i for i in range(150)}
UNKNOWN = 3999
REPQUOTA = os.path.realpath('/sbin/repquota')


def divide(numerator, denominator):
    """As C does and prints it."""
    if denominator:
        return '%f' % (numerator / denominator)
    return 'inf' if numerator else '-nan'


def blocks(name, rows, total_kib):
    """The two blocks of a volume, of the tool's rows (user, used KiB, quota KiB)."""
    most_quota = most_used = 0
    for user, used, quota in rows:
        most_quota = max(most_quota, quota) if quota else total_kib
        most_used = max(most_used, used) if user in ACCOUNTS | MANY else most_used
    shown = sorted((row for row in rows if row[0] in ACCOUNTS | MANY), key=lambda row: row[1])[:100]

    def percent(used, quota):
        single = struct.unpack('f', struct.pack('f', used))[0]
        return '%.1f' % (single * 100.0 / quota if quota else -1.0)
    raw = ',\n'.join(f'[[0, {i}, {divide(float(row[1] * 100), float(most_used))}]]'
                     for i, row in enumerate(shown))
    labels = '\t\t,\n'.join(f"\t\t'{row[0]}'\n" for row in shown)
    table = ',\n'.join(f"['{user}', {quota * 1024}, {used * 1024}, {percent(used, quota)}]"
                       for user, used, quota in shown)
    return SCRIPT + (
        f"var vornQuotaUsageData = {{\n'{name}' : {{\n\tmaxQuota : '{most_quota}',\n"
        f"\tmaxUserUsed: {most_used},\n\tdata: [],\n\traw : [\n{raw}\n],\n"
        f"\tlabels : [\n{labels}\t]\n}}}}\n</script>\n").encode() + SCRIPT + (
        f"var vornQuotaUsageTable = {{\n'{name}' : [\n{table}]}}\n</script>\n").encode()


class Quotas(ProductTest):
    def report_on(self, volume, script=''):
        """Runs the report and, in the same place, a script; (run, the page's data, its output)."""
        self.m.accounts(ACCOUNTS | MANY)
        self.m.profile('q', report_list='quota_usage')
        self.m.shares.write_text(f'[quotas]\npath = {volume}\n')
        run = self.m.shell(f'{PROGRAM} --report q\necho "<<<"\n{script}')
        self.assertEqual((run.status, self.m.status('q')), (0, 'success'), run.err)
        self.assertEqual(self.m.leftovers(), [])
        return run, data_blocks(self.m.report_folders('q')[-1]), run.out.split('<<<\n')[1]

    @needs_loop_devices
    def test_real_tool(self):
        volume = self.m.base / 'volume'
        private_mounts()
        device = mount_image(self, volume, 16 << 20, '-O', '^quota', options='loop,usrquota')
        # The tool looks at the device, which the sandbox's own /dev lacks.
        self.m.options += ['--bind', device, device]
        # Users under, at, above and without a quota, and one that nobody knows.
        usage = {3001: (600, 1000), 3002: (500, 500), 3003: (700, 650), 3004: (400, 0),
                 UNKNOWN: (900, 1200)}
        for uid, (kib, _) in usage.items():
            path = volume / f'file{uid}'
            path.write_bytes(b'x' * (kib << 10))
            os.chown(path, uid, -1)
        call('sync', '-f', volume)
        call('quotacheck', '-cum', volume)
        for uid, (_, soft) in usage.items():
            call('setquota', '-u', uid, soft, 2 * soft, 0, 0, volume)
        run, data, output = self.report_on(
            volume, f"stat -f -c '%S %b %f %a' {volume}\n/sbin/repquota {volume}")
        size, output = output.split('\n', 1)
        block, all_, free, available = map(int, size.split())
        rows = [(user, int(used), int(soft)) for user, used, soft in
                re.findall(r'^(\S+) +[+-]{2} +(\d+) +(\d+) ', output, re.MULTILINE)]
        names = {uid: name for name, uid in ACCOUNTS.items()} | {UNKNOWN: f'#{UNKNOWN}'}
        self.assertEqual({row for row in rows if row[0] != 'root'},
                         {(names[uid], *row) for uid, row in usage.items()})
        self.assertEqual(data, blocks(volume, rows, (all_ - free + available) * block // 1024))
        self.assertEqual(run.log_lines, [])  # that other volumes have none is no error

    def test_tools_that_misbehave(self):
        self.assertTrue(os.path.exists(REPQUOTA), 'install the package quota')
        volume, total = '/tmp/quotas', 4 << 10
        users = [('ann', 5, 0), ('bob', 5, 9), ('root', 1 << 53, 1 << 40), ('x' * 9999, 1, 1),
                 ('john-doe', 0, 7)]
        head, tail = '*** Report\nUser used soft\n-----\n', ' 0 0 0 0 0\n'

        def cat(rows, head=head):
            return "cat <<'END'\n" + head + ''.join(
                f'{user} -- {used} {soft}{tail}' for user, used, soft in rows) + 'END\n'
        many = [(user, i * 37 % 50, i % 3 * 100) for i, user in enumerate(MANY)]
        strangers = [(f'#{i}', i, 20) for i in range(100_000)]
        for name, script, rows, message in (
                ('users', cat(users), users, ''),
                ('nothing used', cat(users[-1:]), users[-1:], ''),
                ('the hundred smallest', cat(many), many, ''),
                ('strangers', cat(strangers + users), strangers + users, ''),
                ('no dashes', cat(users, 'title\n').replace('-', '+'), [], 'parsing command'),
                ('fails', f'{cat(users)}exit 3', None, 'get quota failed'),
                ('is killed', f'{cat(users)}kill -9 $$', None, 'get quota failed'),
                # The first of its two runs is for the exit status only.
                ('prints without end', f'{cat(users)}[ -e /tmp/ran ] && exec yes; touch /tmp/ran',
                 None, 'command printed too much')):
            with self.subTest(name):
                self.m = self.new_machine()
                tool = self.m.base / 'repquota'
                tool.write_text(f'#!/bin/sh\n[ "$1" = {volume} ] || exit 1\n{script}\n')
                tool.chmod(0o755)
                self.m.options += ['--tmpfs', total << 10, volume, '--bind', tool, REPQUOTA]
                run, data, _ = self.report_on(volume)
                log = ''.join(line for line in run.log_lines if 'volume=/ ' not in line)
                self.assertEqual(data, b'' if rows is None else blocks(volume, rows, total))
                self.assertEqual((message in log, log == ''), (True, message == ''), log)
