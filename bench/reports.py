#!/usr/bin/python3
"""Measures all reports, and duplicates by content, against what does the same work.

    bench/reports.py FOLDER [--files N] [--rounds N] [--build DIR] [--only PART,...] [--cold]

Makes trees in FOLDER once (and uses them again later) and prints a table. The parts:

    all      all reports in one run on a tree of N files, against find (its list kept in a file)
             and against pipelines.sh, which makes the same file reports
    peers    the same run against tools that look at every file of a tree: those installed of gdu,
             ncdu, bfs, agedu and duc
    scale    the same run on file indexes of N and 10 N rows: no tree, only rows
    content  duplicates by content against fdupes and jdupes, and the digest against openssl md5
    buckets  duplicates by content among N files of one size: empty ones, and different ones
    crowd    memory with N folders and 5000 owners: a walk of N files, and a file index of 10 N rows
             (as root; two runs of each, so that the second one has a snapshot to compare with)

Each number is the median of the rounds (peak memory: the greatest); a first round warms the cache
and is not counted. Peers alternate within a round, so that whatever else the machine does meets
them all; the CPU time, in brackets, tells how busy a machine was when it is far from the other. With
--cold (as root) the system's caches are dropped before each run.
"""
import argparse
import json
import os
import random
import resource
import shutil
import sqlite3
import statistics
import subprocess
import sys
import tempfile
import time
from pathlib import Path

from gather import EXTENSIONS, FIND, ROOT, WORDS, drop_caches

SHARES = 8
OWNERS = 5
CROWD, CROWD_BEGIN = 5000, 100_000  # owners, and the first one's number
# Peak memory not from getrusage: that counts this interpreter, which the program was forked from.
WATCH = r'''
import re, resource, subprocess, sys, time
begin = time.monotonic()
process = subprocess.Popen(sys.argv[1:], stdout=subprocess.DEVNULL)
peak = "0"
while process.poll() is None:
    with open(f"/proc/{process.pid}/status") as status:
        peak = (re.findall(r"VmHWM:\s+(\d+)", status.read()) or [peak])[0]
    time.sleep(0.01)
used = resource.getrusage(resource.RUSAGE_CHILDREN)
print(time.monotonic() - begin, used.ru_utime + used.ru_stime, int(peak) / 1024)
'''


def made(folder, what):
    """Whether `folder` holds `what` already; clears it if not."""
    done = folder / '.complete'
    if done.exists() and done.read_text() == what:
        return True
    print(f'making {folder} ...', flush=True)
    shutil.rmtree(folder, ignore_errors=True)
    folder.mkdir(parents=True)
    return False


def facts(count):
    """Folder, name, size, age in days and number of the owner of `count` files; about one in 50
    has the name and size of an earlier one."""
    choice = random.Random(1)
    name, size = 'first.txt', 1
    for i in range(count):
        if i % 50:
            name = f'{choice.choice(WORDS)}_{choice.choice(WORDS)}_{i}.{choice.choice(EXTENSIONS)}'
            size = int(choice.lognormvariate(11, 2.5))
        number = i // 16
        yield (f'share{number % SHARES}/{number // 1024}/{number // SHARES % 128}', name, size,
               choice.randrange(1500), choice.randrange(OWNERS))


def make_tree(folder, count):
    if made(folder, str(count)):
        return
    now, last = time.time(), None
    for place, name, size, age, owner in facts(count):
        if place != last:
            os.makedirs(folder / place, exist_ok=True)
            last = place
        path = f'{folder}/{place}/{name}'
        with open(path, 'wb') as file:
            file.truncate(size)
        os.utime(path, (now - age * 86400,) * 2)
        if os.geteuid() == 0:
            os.chown(path, owner, owner)
    (folder / '.complete').write_text(str(count))


def crowd_folders(count):
    """`count` folders in folders of a thousand."""
    return (f'{WORDS[i // 1000 % len(WORDS)]}_{i // 1000}/{WORDS[i % len(WORDS)]} of customer {i}'
            for i in range(count))


def crowd_rows(folders):
    """Ten files in each folder, of CROWD owners, as rows of an index."""
    choice = random.Random(1)
    for i, place in enumerate(crowd_folders(folders)):
        for n in range(10):
            name = f'{choice.choice(WORDS)}_{i}_{n}.{choice.choice(EXTENSIONS)}'
            yield (f'{place}/{name}', name, int(choice.lognormvariate(11, 2.5)),
                   choice.randrange(1500), f'owner{(i + n) % CROWD}')


def make_index(folder, rows, what):
    """A share's file index of (path, name, size, age in days, and perhaps owner)."""
    if made(folder, what):
        return
    now = int(time.time())
    with sqlite3.connect(folder / 'index.db') as db:
        db.execute('CREATE TABLE file_info (owner_name TEXT, time_modify TEXT, size TEXT, '
                   'path TEXT, name TEXT, file_ext TEXT, is_dir INTEGER)')
        db.executemany('INSERT INTO file_info VALUES (?, ?, ?, ?, ?, ?, 0)', (
            (*(owner or ['root']), now - age * 86400, size, path, name, name.rpartition('.')[2])
            for path, name, size, age, *owner in rows))
    (folder / '.complete').write_text(what)


def make_crowd_tree(folder, folders):
    """`folders` folders with a file each, of CROWD owners."""
    if made(folder, str(folders)):
        return
    choice = random.Random(1)
    for i, place in enumerate(crowd_folders(folders)):
        os.makedirs(folder / place)
        path = folder / place / f'{choice.choice(WORDS)}_{i}.{choice.choice(EXTENSIONS)}'
        with open(path, 'wb') as file:
            file.truncate(int(choice.lognormvariate(11, 2.5)))
        os.chown(path, CROWD_BEGIN + i % CROWD, 0)
    (folder / '.complete').write_text(str(folders))


def make_equal_size(folder, count):
    """Files of eight bytes, all different."""
    if made(folder, str(count)):
        return
    for i in range(count):
        if i % 1000 == 0:
            (folder / str(i // 1000)).mkdir()
        (folder / str(i // 1000) / str(i)).write_bytes(b'%08d' % i)
    (folder / '.complete').write_text(str(count))


def make_duplicates(folder, groups=5000):
    """Groups of four files: three equal ones and one that differs in its last byte."""
    if made(folder, str(groups)):
        return
    for i in range(groups):
        place = folder / str(i // 100)
        place.mkdir(exist_ok=True)
        content = os.urandom(random.Random(i).randrange(4096, 1 << 17))
        for j in range(4):
            (place / f'{i}-{j}').write_bytes(content if j else content[:-1] + b'x')
    (folder / '.complete').write_text(str(groups))


class Result:
    def __init__(self, rounds):
        self.seconds = statistics.median(run[0] for run in rounds[1:])
        self.cpu = statistics.median(run[1] for run in rounds[1:])
        self.peak = max(run[2] for run in rounds)

    def __truediv__(self, other):
        return self.seconds / other.seconds

    def __str__(self):
        memory = f', {self.peak:.0f} MiB' if self.peak else ''
        return f'{self.seconds:.2f} s ({self.cpu:.2f} s){memory}'


class Bench:
    def __init__(self, arguments, work):
        self.base = arguments.folder.resolve() / 'vornreport-bench-reports'
        self.files, self.rounds = arguments.files, arguments.rounds
        self.is_cold = arguments.cold
        self.work = Path(work).resolve()
        self.stage = self.work / 'stage'
        formats = json.loads((arguments.build / 'report_format.json').read_text())
        self.every_report = ','.join(report['name'] for report in formats['reports'])
        subprocess.run(['cmake', '--install', str(arguments.build)], check=True,
                       stdout=subprocess.DEVNULL, env=os.environ | {'DESTDIR': str(self.stage)})
        self.config = self.stage / 'usr/vorn/etc/vornreport.conf'
        self.shipped = self.config.read_text()
        self.options = []  # for the sandbox

    def report(self, shares, reports='duplicate_file', **keys):
        """Seconds, CPU seconds and peak MiB; `shares` is (name, folder, index or None)."""
        (self.stage / 'usr/vorn/etc/share.conf').write_text(''.join(
            f'[{name}]\npath = {folder}\n' + (f'file_index = {index}\n' if index else '')
            for name, folder, index in shares))
        self.config.write_text(self.shipped + f'\n[bench]\nreport_list = {reports}\n' + ''.join(
            f'{key} = {value}\n' for key, value in keys.items()))
        result = subprocess.run(
            [ROOT / 'tools/sandbox.sh', '--stage', self.stage, *self.options, '--', sys.executable,
             '-c', WATCH, '/usr/vorn/bin/vornreport', '--report', 'bench'],
            stdout=subprocess.PIPE, check=True, stderr=subprocess.DEVNULL).stdout.split()
        status = (self.stage / 'usr/vorn/var/status/bench').read_text().splitlines()[0]
        if status != 'success':
            raise SystemExit(f'the report ended with the status "{status}"')
        shutil.rmtree(self.stage / 'usr/vorn/var/reports/bench')
        return tuple(map(float, result))

    def timed(self, *command, output='list'):
        def cpu():
            used = resource.getrusage(resource.RUSAGE_CHILDREN)
            return used.ru_utime + used.ru_stime
        start, before = time.monotonic(), cpu()
        with open(self.work / output, 'wb') as file:
            subprocess.run(list(map(str, command)), stdout=file, check=True)
        return time.monotonic() - start, cpu() - before, 0

    def compare(self, *runs):
        """The Result of each run, taken in turns."""
        results = [[] for _ in runs]
        for number in range(self.rounds + 1):
            for series, run in zip(results, runs):
                if self.is_cold:
                    drop_caches()
                series.append(run())
            print('   ', ' '.join(f'{series[-1][0]:.2f}' for series in results), flush=True)
        return [Result(series) for series in results]

    def tree(self):
        """The tree of `files` files, and its shares."""
        tree = self.base / 'tree'
        make_tree(tree, self.files)
        return tree, [(f'share{i}', tree / f'share{i}', None) for i in range(SHARES)]

    def all(self):
        tree, shares = self.tree()
        pipes = self.work / 'pipes'
        pipes.mkdir()
        command = [str(tree) if part is None else part for part in FIND]
        script = ROOT / 'bench/pipelines.sh'
        find, shell, once, report = self.compare(
            lambda: self.timed(*command), lambda: self.timed(script, tree, pipes),
            lambda: self.timed(script, tree, pipes, 'once'), lambda: self.report(shares, self.every_report))
        yield f'find, {self.files} files', find, ''
        yield 'pipelines.sh', shell, f'{shell / find:.2f} x find'
        yield 'pipelines.sh, one list for all', once, f'{once / find:.2f} x find'
        yield ('all reports', report,
               f'{report / find:.2f} x find, {report / shell:.2f} and {report / once:.2f} x '
               'pipelines.sh')

    def peers(self):
        tree, shares = self.tree()
        tools = {'gdu': ['--non-interactive', '--no-progress', tree],
                 'ncdu': ['-0', '-o', '/dev/null', tree],
                 'bfs': [tree, '-type', 'f', '-printf', FIND[-1]],
                 'agedu': ['-f', self.work / 'agedu.dat', '-s', tree],
                 'duc': ['index', '-q', '-d', self.work / 'duc.db', tree]}
        tools = {name: words for name, words in tools.items() if shutil.which(name)}
        command = [str(tree) if part is None else part for part in FIND]
        find, report, *others = self.compare(
            lambda: self.timed(*command), lambda: self.report(shares, self.every_report),
            *(lambda tool=tool: self.timed(*tool) for tool in
              ([name, *words] for name, words in tools.items())))
        yield f'find, {self.files} files', find, ''
        yield 'all reports', report, f'{report / find:.2f} x find'
        for name, other in zip(tools, others):
            yield name, other, f'{other / find:.2f} x find'

    def scale(self):
        runs = []
        for count in (self.files, 10 * self.files):
            folder = self.base / f'index{count}'
            make_index(folder, ((f'{place}/{name}', name, size, age)
                                for place, name, size, age, _ in facts(count)), str(count))
            runs.append(lambda folder=folder: self.report(
                [('rows', folder, folder / 'index.db')], self.every_report))
        one, ten = self.compare(*runs)
        yield f'all reports, {self.files} rows', one, ''
        yield ('ten times the rows', ten,
               f'{ten / one:.1f} x the time, {ten.cpu / one.cpu:.1f} x the CPU time')

    def content(self):
        tree, large, empty = (self.base / name for name in ('duplicates', 'large', 'empty'))
        make_duplicates(tree)
        size = 1 << 29
        if not made(large, 'two'):
            for name in 'ab':
                with open(large / name, 'wb') as file:
                    for i in range(size >> 20):
                        file.write(i.to_bytes(4, 'little') * (1 << 18))
            (large / '.complete').write_text('two')
        empty.mkdir(exist_ok=True)

        def by_content(folder):
            return lambda: self.report([('share', folder, None)], duplicate_compare='true')
        fdupes, jdupes, report, openssl, digest, idle = self.compare(
            lambda: self.timed('fdupes', '-r', '-q', tree),
            lambda: self.timed('jdupes', '-r', '-q', tree), by_content(tree),
            lambda: self.timed('openssl', 'md5', large / 'a', large / 'b'), by_content(large),
            by_content(empty))
        digest.seconds -= idle.seconds
        yield 'fdupes, 20000 files, three in four equal', fdupes, ''
        yield 'jdupes', jdupes, ''
        yield ('duplicates by content', report, f'{fdupes / report:.2f} x the speed of fdupes, '
               f'{jdupes / report:.2f} x of jdupes')
        yield 'openssl md5, 1 GiB', openssl, f'{1024 / openssl.seconds:.0f} MiB/s'
        yield ('the digest', digest, f'{1024 / digest.seconds:.0f} MiB/s, '
               f'{openssl / digest:.2f} x the speed of openssl')

    def buckets(self):
        tree = self.base / 'equal'
        make_equal_size(tree, self.files)
        runs = []
        for count in (self.files // 4, self.files):
            for size, name in ((0, 'none'), (8, 'equal')):
                folder = self.base / f'{name}{count}'
                make_index(folder, ((f'{i // 1000}/{i}', str(i), size, 9) for i in range(count)),
                           str(count))
                runs.append(lambda folder=folder: self.report(
                    [('share', tree, folder / 'index.db')], duplicate_compare='true'))
        results = self.compare(*runs)
        for quarter, whole, what in zip(
                results[:2], results[2:], ('empty files', 'files of 8 bytes, all different')):
            yield (f'{self.files} {what}', whole,
                   f'{whole / quarter:.1f} x the time of a quarter of them')

    def crowd(self):
        tree, index = (self.base / f'crowd-{kind}{self.files}' for kind in ('tree', 'index'))
        make_crowd_tree(tree, self.files)
        make_index(index, crowd_rows(self.files), str(self.files))
        for name, text in (('passwd', ''.join(
                f'owner{i}:x:{CROWD_BEGIN + i}:0::/:/bin/sh\n' for i in range(CROWD))), ('group', '')):
            (self.work / name).write_text(f'root:x:0:{"0::/:/bin/sh" if text else ""}\n' + text)
            self.options += ['--bind', self.work / name, f'/etc/{name}']
        for shares, what in (([('crowd', tree, None)], f'{self.files} files walked'),
                             ([('crowd', index, index / 'index.db')], f'{10 * self.files} rows')):
            before, last = (self.report(shares, self.every_report) for _ in range(2))
            yield (f'{what}, {self.files} folders, {CROWD} owners', Result([before, last]), '')


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument('folder', type=Path)
    parser.add_argument('--files', type=int, default=1_000_000)
    parser.add_argument('--rounds', type=int, default=5)
    parser.add_argument('--build', type=Path, default=ROOT / 'build')
    parser.add_argument('--only', default='all,peers,scale,content,buckets')
    parser.add_argument('--cold', action='store_true', help='drop the caches before each run')
    arguments = parser.parse_args()
    rows = []
    with tempfile.TemporaryDirectory(dir=arguments.folder) as work:
        bench = Bench(arguments, work)
        for part in arguments.only.split(','):
            print(part, flush=True)
            rows += getattr(bench, part)()
    print('| work | result | ratio |\n|---|---|---|')
    for row in rows:
        print('| ' + ' | '.join(map(str, row)) + ' |')


if __name__ == '__main__':
    main()
