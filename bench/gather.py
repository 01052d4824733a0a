#!/usr/bin/python3
"""Compares gathering with what find needs for the same facts.

    bench/gather.py FOLDER [--files N] [--rounds N] [--build DIR] [--cold]

Makes a tree of N files in FOLDER once (and uses it again later), then alternates

    find, its list kept in a file
    find, its list thrown away
    vornreport --report, with gathering timed between its "stat start" and "stat complete" lines

and prints the median of each. The first round warms the cache and is not counted. With --cold (as
root) the system's caches are dropped before each run instead.
"""
import argparse
import os
import random
import shutil
import statistics
import subprocess
import sys
import tempfile
import time
from pathlib import Path

ROOT = Path(__file__).resolve().parents[1]
FIND = ['find', None, '-type', 'f', '-printf', '%s %T@ %U %p\n']
FILES_PER_FOLDER = 16
EXTENSIONS = ['jpg'] * 6 + ['pdf', 'docx', 'xlsx', 'mp4', 'mp3', 'txt', 'zip', 'raw', 'eml', 'html']
WORDS = ('report invoice holiday scan draft final copy meeting notes budget photo backup project '
         'customer contract summer winter archive old new plan').split()


def make_tree(folder, count):
    done = folder / '.complete'
    if done.exists() and done.read_text() == str(count):
        return
    print(f'making {count} files in {folder} ...', flush=True)
    shutil.rmtree(folder, ignore_errors=True)
    choice = random.Random(1)

    def name():
        return f'{choice.choice(WORDS)}_{choice.choice(WORDS)}_{choice.randrange(10000)}'
    for start in range(0, count, FILES_PER_FOLDER):
        number = start // FILES_PER_FOLDER
        place = folder / f'{number // 1024}' / f'{number // 32 % 32:02}' / name()
        place.mkdir(parents=True, exist_ok=True)
        for i in range(min(FILES_PER_FOLDER, count - start)):
            with open(place / f'{name()}_{i}.{choice.choice(EXTENSIONS)}', 'wb') as file:
                file.truncate(int(choice.lognormvariate(11, 2.5)))
    done.write_text(str(count))


def drop_caches():
    subprocess.run(['sync'], check=True)
    Path('/proc/sys/vm/drop_caches').write_text('3')


def run_find(folder, output):
    command = [str(folder) if part is None else part for part in FIND]
    start = time.monotonic()
    with open(output, 'wb') as file:
        subprocess.run(command, stdout=file, check=True)
    return time.monotonic() - start


def run_report(stage):
    """(seconds of gathering, seconds of the whole process, peak resident KiB)"""
    command = [str(ROOT / 'tools/sandbox.sh'), '--stage', str(stage), '--', sys.executable, '-c', r'''
import re, subprocess, sys, time
marks = {}
peak = [0]
begin = time.monotonic()
process = subprocess.Popen(sys.argv[1:], stdout=subprocess.PIPE)
for line in process.stdout:
    for mark in (b"stat start", b"stat complete"):
        if line.rstrip().endswith(mark):
            marks[mark] = time.monotonic()
    # Not from getrusage: that counts this interpreter, which the program was forked from.
    with open(f"/proc/{process.pid}/status") as status:
        peak = re.findall(r"VmHWM:\s+(\d+)", status.read()) or peak
process.wait()
total = time.monotonic() - begin
print(marks[b"stat complete"] - marks[b"stat start"], total, peak[0])
''', '/usr/vorn/bin/vornreport', '--report', 'bench']
    result = subprocess.run(command, stdout=subprocess.PIPE, check=True).stdout
    status = (stage / 'usr/vorn/var/status/bench').read_text().splitlines()[0]
    if status != 'success':
        raise SystemExit(f'the report ended with the status "{status}"')
    return [float(number) for number in result.split()]


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument('folder', type=Path)
    parser.add_argument('--files', type=int, default=1_000_000)
    parser.add_argument('--rounds', type=int, default=5)
    parser.add_argument('--build', type=Path, default=ROOT / 'build')
    parser.add_argument('--cold', action='store_true', help='drop the caches before each run')
    arguments = parser.parse_args()
    folder = arguments.folder.resolve() / 'vornreport-bench-tree'
    make_tree(folder, arguments.files)

    kept, thrown, gathered, whole, memory = [], [], [], [], []
    with tempfile.TemporaryDirectory(dir=arguments.folder) as work:
        stage = Path(work).resolve() / 'stage'
        subprocess.run(['cmake', '--install', str(arguments.build)], check=True,
                       stdout=subprocess.DEVNULL, env=os.environ | {'DESTDIR': str(stage)})
        (stage / 'usr/vorn/etc/share.conf').write_text(f'[tree]\npath = {folder}\n')
        with (stage / 'usr/vorn/etc/vornreport.conf').open('a') as file:
            file.write('\n[bench]\nreport_list = share_list\n')
        for number in range(arguments.rounds + 1):
            results = []
            for run in (lambda: [run_find(folder, Path(work) / 'list')],
                        lambda: [run_find(folder, os.devnull)], lambda: run_report(stage)):
                if arguments.cold:
                    drop_caches()
                results += run()
            print(f'round {number}: ' + ' '.join(f'{result:.2f}' for result in results),
                  flush=True)
            if number > 0:
                for series, result in zip((kept, thrown, gathered, whole, memory), results):
                    series.append(result)

    base = statistics.median(kept)
    print(f'{arguments.files} files, median of {arguments.rounds} rounds, '
          f'{"caches dropped before each run" if arguments.cold else "warm cache"}')
    for label, series in (('find > list', kept), ('find > /dev/null', thrown),
                          ('gathering', gathered), ('whole report run', whole)):
        median = statistics.median(series)
        print(f'{label:18} {median:8.2f} s   {median / base:5.2f} of find > list')
    print(f'{"peak memory":18} {statistics.median(memory) / 1024:8.1f} MiB')


if __name__ == '__main__':
    main()
