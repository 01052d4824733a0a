#!/usr/bin/python3
"""Measures a fleet on two engines on this machine (as root: packages clickhouse-server, -client).

    bench/fleet.py FOLDER [--ship FILES] [--rows N] [--servers N,...] [--build DIR]

    ship    a run over a tree of FILES files, without a fleet and with one: what the sending costs,
            and the peak memory of both
    report  N rows of as many servers as --servers, on two shards: bytes a row on disk, and the time
            of each of the reports over the fleet and of all nine. With several numbers of servers
            that is done for each; every server has 8 shares
"""
import argparse
import os
import shutil
import statistics
import subprocess
import sys
import tempfile
import time
import unittest
from pathlib import Path

ROOT = Path(__file__).resolve().parents[1]
sys.path.insert(0, str(ROOT / 'tests/e2e'))
sys.path.insert(0, str(ROOT / 'bench'))
NINE = ('quota_usage', 'file_owner', 'volume_usage', 'share_list', 'file_group', 'duplicate_file',
        'large_file', 'least_modify', 'most_modify')
BATCH = 1_000_000


def machine(options):
    from harness import Machine
    base = Path(tempfile.mkdtemp(prefix='vorn-', dir=options.folder))
    options.test.addCleanup(shutil.rmtree, base)
    subprocess.run(['cmake', '--install', str(options.build)], check=True, stdout=subprocess.DEVNULL,
                   env=os.environ | {'DESTDIR': str(base / 'built')})
    made = Machine(base, base / 'built')
    made.log = made.new_log()
    return made


def timed(made, *command):
    """Seconds, and the greatest memory in MiB, of a program in the product's place."""
    from reports import WATCH
    done = subprocess.run(made.sandbox(made.log) + ['--', sys.executable, '-c', WATCH, *command],
                          stdout=subprocess.PIPE, check=True, text=True)
    seconds, _, memory = map(float, done.stdout.split()[-3:])
    return seconds, memory


def ship(options, shards):
    import gather
    tree = options.folder / 'vornreport-bench-tree'
    gather.make_tree(tree, options.ship)
    made = machine(options)
    made.share('files', tree)
    lists = ','.join(name for name in NINE) + ',folder_usage,file_age,coverage'
    made.profile('alone', report_list=lists)
    made.profile('fleet', report_list=lists, fleet='true')
    ctl(made, 'fleet', 'set', '--url', shards.urls, '--cluster', 'shards')
    ctl(made, 'fleet', 'init')
    found = {name: [] for name in ('alone', 'fleet')}
    for _ in range(options.rounds + 1):
        for name, results in found.items():
            results.append(timed(made, '/usr/vorn/bin/vornreport', '--report', name))
    medians = {name: statistics.median(r[0] for r in results[1:]) for name, results in found.items()}
    memory = {name: max(r[1] for r in results[1:]) for name, results in found.items()}
    # Of runs that follow each other: the machine's speed changes from minute to minute.
    more = statistics.median(fleet[0] / alone[0] for alone, fleet in
                             list(zip(found['alone'], found['fleet']))[1:])
    print(f"a run over {options.ship} files: {medians['alone']:.2f} s, {memory['alone']:.0f} MiB; with "
          f"a fleet {medians['fleet']:.2f} s, {memory['fleet']:.0f} MiB: "
          f"{100 * (more - 1):.0f} % more time")


def ctl(made, *arguments):
    command = ['--', '/usr/vorn/bin/vornctl', *map(str, arguments)]
    done = subprocess.run(made.sandbox(made.log) + command, text=True, capture_output=True)
    if done.returncode not in (0, 3):
        sys.exit(done.stdout + done.stderr)
    return done.stdout


def fill(options, servers, shards):
    """Rows as a walk has them: paths in folders, sizes of all kinds, one file in five a duplicate."""
    rows = options.rows // servers
    for server in range(servers):
        for first in range(0, rows, BATCH):
            count = min(BATCH, rows - first)
            random = f'cityHash64(n, {server}, %d)'
            shards.ask(f"""insert into file select 'server{server}', 'weekly',
                {10 ** 15 + server}, toInt64(n), 1000 + {random % 1} % 20,
                concat('user', toString({random % 1} % 20)),
                toInt64(1600000000 + {random % 2} % 160000000),
                if(n % 5 = 0, toInt64(4096 + n % 100000),
                   toInt64(exp2({random % 3} % 300 / 10)) + toInt64({random % 4} % 4096)),
                concat('share', toString(n % 8)),
                concat('/srv/share', toString(n % 8), '/project-', toString(intDiv(n, 4000)),
                       '/folder-', toString(intDiv(n, 40)), '/', name),
                name, inf, concat('reportUI_file_type_', kind)
                from (select number + {first} as n, concat(word, '_', toString(
                        if(n % 5 = 0, n % 100000, {random % 5} % 10000000)), '.', kind) as name,
                    arrayElement(['report', 'IMG', 'draft', 'model', 'notes'], 1 + n % 5) as word,
                    arrayElement(['image', 'text', 'video', 'archive', 'other'], 1 + n % 3) as kind
                    from numbers({count}))""")
        now = int(time.time())
        facts = '{"format": 1, "shares": [' + ', '.join(
            f'{{"name": "share{i}", "path": "/srv/share{i}"}}' for i in range(8)) + ']}'
        shards.ask('insert into report_row values ' + ', '.join(
            f"('server{server}', 'weekly', {10 ** 15 + server}, 'share', {i}, "
            f"['share{i}', '/srv/share{i}', '/srv'])" for i in range(8)))
        shards.ask(f"""insert into run values ('server{server}', 'weekly', {10 ** 15 + server}, {now},
            {now}, {rows}, 0, 0, {rows + 8}, '{facts}')""")


def report(options, servers, shards):
    made = machine(options)
    for engine in shards.engines:
        engine.ask('drop database if exists vornreport')
    ctl(made, 'fleet', 'set', '--url', shards.urls, '--cluster', 'shards')
    ctl(made, 'fleet', 'init')
    fill(options, servers, shards)
    on_disk = [engine.ask("select sum(bytes_on_disk), sum(rows) from system.parts where active and "
                          "table = 'file_part'").split() for engine in shards.engines]
    size, rows = (sum(int(one[i]) for one in on_disk) for i in (0, 1))
    print(f"{rows} rows of {servers} servers on {len(shards.engines)} shards ({', '.join(one[1] for one in on_disk)}): "
          f"{size / rows:.0f} bytes a row")
    for names in (*((name,) for name in NINE), NINE):
        seconds = []
        for _ in range(options.rounds):
            begin = time.monotonic()
            ctl(made, 'fleet', 'report', made.base / 'reports', '--reports', ','.join(names))
            seconds.append(time.monotonic() - begin)
        print(f"{names[0] if len(names) == 1 else 'all nine'}: {statistics.median(seconds):.2f} s",
              flush=True)


class Bench(unittest.TestCase):
    """The engines end with it."""
    options = None

    def test(self):
        from engine import Shards
        self.options.test = self
        shards = Shards(self)
        if self.options.ship:
            ship(self.options, shards)
        for servers in self.options.servers.split(',') if self.options.rows else ():
            report(self.options, int(servers), shards)


if __name__ == '__main__':
    parser = argparse.ArgumentParser()
    parser.add_argument('folder', type=Path)
    parser.add_argument('--ship', type=int, default=1_000_000)
    parser.add_argument('--rows', type=int, default=10_000_000)
    parser.add_argument('--servers', default='10')
    parser.add_argument('--rounds', type=int, default=3)
    parser.add_argument('--build', type=Path, default=ROOT / 'build')
    Bench.options = parser.parse_args()
    os.environ['VORN_BUILD'] = str(Bench.options.build)
    unittest.main(argv=sys.argv[:1])
