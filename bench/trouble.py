#!/usr/bin/python3
"""Makes trouble for runs of the staged product, and counts how they end.

    bench/trouble.py [--build DIR] [--times N] [--only KIND,...] [--seed N]

    sigterm   SIGTERM at a random moment of a run, then a run that is left alone
    sigkill   SIGKILL at a random moment of a run, then a run that is left alone
    starts    five runs of one profile at once: one at a time makes a report, the others say so
    clean     --clean of all profiles at a random moment beside a run
    settings  vornctl profile set beside --clean of its profile: neither undoes what the other did

Of each kind there are N (200); for `settings` and `starts` each counts as one. The columns:

    whole     ends as "success", with a report that shows what it has to
    told      ends as anything else and says so: by its exit status, its output or its status
    wrong     a report that isn't right, an end that nobody is told of, a run after trouble that
              doesn't succeed, a setting that is lost, or anything left over; this is to be 0

Needs root and bubblewrap. The last lines say what was wrong.
"""
import argparse
import collections
import json
import os
import random
import re
import shutil
import signal
import subprocess
import sys
import tempfile
import time
from pathlib import Path

ROOT = Path(__file__).resolve().parents[1]
VORN = Path('/usr/vorn')
PROGRAM, CTL = VORN / 'bin/vornreport', VORN / 'bin/vornctl'
PROFILE = 'trouble'
REPORTS = VORN / 'var/reports' / PROFILE
STATUS = VORN / 'var/status' / PROFILE
CONFIG = VORN / 'etc/vornreport.conf'
LIMIT = 60  # seconds, which no run comes near
RUN = [PROGRAM, '--report', PROFILE]
KEPT = 'schedule_collect_id = trouble\n'


class Wrong(Exception):
    """What a run did that it must not."""


def must(condition, what):
    if not condition:
        raise Wrong(what)


def make_server(base, files):
    for number in range(files):
        path = base / 'share' / str(number % 50) / f'{number}.{("jpg", "mp3", "x")[number % 3]}'
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_bytes(b'x' * (number % 7 * 100))
    (VORN / 'etc/share.conf').write_text(f'[share]\npath = {base}/share\n')
    CONFIG.write_text(f'[global]\nreport_list = volume_usage\n\n[{PROFILE}]\n'
                      'report_list = share_list,file_owner,duplicate_file\n'
                      f'duplicate_compare = true\n{KEPT}')


def start(command=RUN):
    return subprocess.Popen(command, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE,
                            stderr=subprocess.STDOUT, text=True, errors='replace')


def finish(process):
    output = process.communicate(timeout=LIMIT)[0]
    return process.returncode, output


def word():
    return STATUS.read_text().split('\n')[0] if STATUS.exists() else ''


def stored():
    """The number of finished reports, which must be right, and are removed."""
    found = [path for path in REPORTS.glob('[0-9]*')]
    for path in found:
        facts = json.loads((path / 'report.json').read_text())
        blocks = (path / 'report.html').read_text().split('var vornFacts')[0]
        must(blocks.split('<template id="data">')[1] == RIGHT and not facts['incidents'],
             'the report is not right')
        must((path / 'report.html').read_text().endswith('\n</html>\n'), 'the page has no end')
        shutil.rmtree(path)
    return len(found)


def check_nothing_left():
    left = [*Path('/tmp').glob('vornreport_*'), *REPORTS.glob('.*'),
            *(VORN / 'var/status').glob(f'.{PROFILE}.??????'), *(VORN / 'etc').glob('.*.??????')]
    left += [path for path in (VORN / 'var/stat').rglob('*') if not path.is_dir()]
    left += [*(VORN / 'var/progress').glob('*')]
    must(not left, f'left over: {left}')


def check_run():
    """A run that is left alone succeeds and clears up, whatever was before."""
    status, output = finish(start())
    must((status, word(), stored()) == (0, 'success', 1),
         f'the next run ends with {status}, "{word()}": {output[-300:]}')
    check_nothing_left()


# Seconds of an undisturbed run, found by trying; trouble comes at any of its moments.
def any_moment():
    time.sleep(random.uniform(0, LENGTH * 1.1))


def killed(number):
    STATUS.unlink(missing_ok=True)
    process = start()
    any_moment()
    process.send_signal(number)
    status, _ = finish(process)
    ended = 'whole' if status == 0 else 'told'
    # Between the last rename and the last word a report may be there already: it has to be right.
    count = stored()
    must((word() == 'success') <= (count == 1) and (status != 0 or word() == 'success'),
         f'exit status {status}, status "{word()}", {count} reports')
    check_run()
    return ended


def starts(_):
    ended = [finish(process) for process in [start() for _ in range(5)]]
    skipped = sum(f'profile={PROFILE} is running, skip' in output for _, output in ended)
    count = stored()
    # Who comes when the first is done makes a report of its own.
    must(all(status == 0 for status, _ in ended) and count >= 1 and count + skipped == 5 and
         word() == 'success', f'{skipped} skipped, {count} reports, status "{word()}"')
    check_nothing_left()
    return 'whole'


def clean(_):
    process = start()
    any_moment()
    cleaned, output = finish(start([PROGRAM, '--clean']))
    status, _ = finish(process)
    must((status, cleaned, word(), stored()) == (0, 0, 'success', 1),
         f'the run ends with {status}, "{word()}", the clean with {cleaned}: {output[-300:]}')
    check_nothing_left()
    return 'whole'


def settings(number):
    text = CONFIG.read_text()
    if KEPT not in text:
        CONFIG.write_text(text.rstrip('\n') + '\n' + KEPT)
    value = str(number % 50 + 1)
    both = [start([CTL, 'profile', 'set', PROFILE, 'keep_reports', value]),
            start([PROGRAM, '--clean', PROFILE])]
    if number % 2:
        both.reverse()
    (one, said), (two, _) = map(finish, both)
    now = CONFIG.read_text()
    found = re.findall(r'keep_reports = (\d+)', now)
    must((one, two, found) == (0, 0, [value]), f'{one}, {two}, {found} for {value}: {said[-300:]}')
    must(KEPT not in now and 'duplicate_compare = true' in now, 'what --clean removes is back')
    return 'whole'


KINDS = {'sigterm': lambda _: killed(signal.SIGTERM), 'sigkill': lambda _: killed(signal.SIGKILL),
         'starts': starts, 'clean': clean, 'settings': settings}


def inside(args):
    global RIGHT, LENGTH
    random.seed(args.seed)
    base = Path(tempfile.mkdtemp(prefix='trouble-', dir='/var/tmp'))
    try:
        make_server(base, args.files)
        finish(start())
        begin = time.monotonic()
        finish(start())
        LENGTH = time.monotonic() - begin
        folder = max(REPORTS.glob('[0-9]*'))
        RIGHT = (folder / 'report.html').read_text().split('var vornFacts')[0].split(
            '<template id="data">')[1]
        stored()
        print(f'{"kind":9} {"times":>6} {"whole":>6} {"told":>6} {"wrong":>6}')
        wrong = [line for kind in args.only or KINDS for line in make_trouble(kind, args.times)]
        print(*wrong, sep='\n')
        return bool(wrong)
    finally:
        shutil.rmtree(base)


def make_trouble(kind, times):
    counts, wrong = collections.Counter(), []
    for number in range(times):
        try:
            counts[KINDS[kind](number)] += 1
        except Wrong as error:
            counts['wrong'] += 1
            wrong.append(f'{kind} {number}: {error}')
            for path in REPORTS.glob('[0-9]*'):
                shutil.rmtree(path)
    print(f'{kind:9} {times:6} {counts["whole"]:6} {counts["told"]:6} {counts["wrong"]:6}', flush=True)
    return wrong


def main():
    parser = argparse.ArgumentParser(description=__doc__.split('\n')[0])
    parser.add_argument('--build', type=Path, default=ROOT / 'build')
    parser.add_argument('--times', type=int, default=200)
    parser.add_argument('--files', type=int, default=2000, help='that the share holds')
    parser.add_argument('--only', type=lambda text: text.split(','))
    parser.add_argument('--seed', type=int, default=1)
    parser.add_argument('--inside', action='store_true', help=argparse.SUPPRESS)
    args = parser.parse_args()
    if args.inside:
        sys.exit(inside(args))
    with tempfile.TemporaryDirectory(prefix='trouble-', dir='/var/tmp') as stage:
        subprocess.run(['cmake', '--install', args.build], check=True, stdout=subprocess.DEVNULL,
                       env=os.environ | {'DESTDIR': stage})
        sys.exit(subprocess.run([ROOT / 'tools/sandbox.sh', '--stage', stage, '--', sys.executable,
                                 __file__, '--inside', *sys.argv[1:]]).returncode)


if __name__ == '__main__':
    main()
