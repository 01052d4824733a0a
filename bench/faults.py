#!/usr/bin/python3
"""Fails every system call of a run once, and looks for a page that differs without saying so.

    bench/faults.py [--build DIR] [--only CALL,...] [--errors NAME,...] [--every N]

Two shares, files of three owners, a volume and a quota tool make one report with all sections. A
first run under strace counts the system calls of the program. Then, for each of them, the run is
made again with that one call failing (strace's fault injection), and its page and CSV files are
compared with those of the undisturbed run. What may differ from run to run (times, what is used on
the volume) is left out of the comparison. These are the calls of the main thread. Those of the
threads that look ahead follow for one share's folders: each line has the calls on that folder.

    same    the report is what it would have been
    told    it is not, and the run says so: status "fail", no report, or an incident in the report
    untold  it is not, and nobody is told; the last column is to be 0

Needs root, strace and bubblewrap. The last lines list each call that wasn't told.
"""
import argparse
import collections
import json
import os
import re
import shutil
import socket
import subprocess
import sys
import tempfile
import threading
from pathlib import Path

ROOT = Path(__file__).resolve().parents[1]
VORN = Path('/usr/vorn')
PROGRAM = VORN / 'bin/vornreport'
PROFILE = 'faults'
# Of the dynamic loader, before the program begins, and of its end.
BEFORE = 'execve arch_prctl set_tid_address set_robust_list rseq prlimit64'.split()
# A close that fails has closed all the same, which strace can't play, and waking a thread never fails.
NEVER = ['exit_group', 'rt_sigreturn', 'restart_syscall', 'close', 'getpid', 'futex']
ERRORS = 'EIO,ENOMEM,EACCES,EINTR'
LIMIT = 120  # seconds, which no run comes near
OWNERS = {'root': 0, 'games': 5, 'mail': 8}
QUOTA_TOOL = '''#!/bin/sh
echo "*** Report for user quotas on device"
echo "User            used    soft    hard  grace    used  soft  hard  grace"
echo "----------------------------------------------------------------------"
echo "root      --      20       0       0              2     0     0"
echo "games     --      90     100     200              5     0     0"
'''


def make_server(base):
    shares = ''
    for share in ('photos', 'music'):
        for number, (name, uid) in enumerate(OWNERS.items()):
            folder = base / share / f'of {name}'
            folder.mkdir(parents=True)
            for i in range(3):
                path = folder / f'{share} {i}.{("jpg", "mp3", "x")[i]}'
                path.write_bytes(b'x' * (1000 * (number + 1) * (i + 1)))
                os.chown(path, uid, uid)
                os.utime(path, (1.6e9 + i, 1.6e9 + i))
        shares += f'[{share}]\npath = {base / share}\n'
    (VORN / 'etc/share.conf').write_text(shares)
    reports = ','.join(report['name'] for report in FORMAT['reports'])
    (VORN / 'etc/vornreport.conf').write_text(
        f'[global]\nreport_list = volume_usage\n\n[{PROFILE}]\nreport_list = {reports}\n'
        'volume_history = true\nduplicate_compare = true\n')


def normal(text):
    """A block or CSV file without what differs from run to run."""
    if b'VolumeUsage' in text or text.startswith(b'\xef\xbb\xbfVolume,'):
        text = re.sub(rb'[\d.]+%?|\'-\'|"-"', b'#', text)
        text = re.sub(rb"(\[ '#', # \],?\n)+", b'', text)  # as many as there were runs
    return text


def contents(folder):
    """What a report shows, and its facts."""
    page = (folder / 'report.html').read_bytes()
    frame = re.sub(rb'data-time="\d+"|<p>[^<]*</p>', b'', page.split(b'</template>')[1])
    blocks = page.split(b'<template id="data">')[1].split(b'</template>')[0]
    shown = [normal(block) for block in blocks.split(b'<script') if b'var vornFacts' not in block]
    for path in sorted((folder / 'csv').iterdir()):
        shown.append(path.name.encode() + b'\n' + normal(path.read_bytes()))
    facts = json.loads((folder / 'report.json').read_text())
    for volume in facts['volumes']:
        shown.append(f'{volume["id"]} {volume["forecast"]["state"]}'.encode())
    for key in ('shares', 'owners', 'types', 'quotas', 'duplicates', 'reports'):
        shown.append(json.dumps(facts[key]).encode())
    return [frame, *shown], facts


def run(options=()):
    """The shown contents (None without a report that is a success) and whether something is told."""
    reports = VORN / 'var/reports' / PROFILE
    shutil.rmtree(reports, ignore_errors=True)
    status = VORN / 'var/status' / PROFILE
    status.unlink(missing_ok=True)
    history = VORN / 'etc/vornreport.db'
    history.unlink(missing_ok=True)
    done = subprocess.run([*options, PROGRAM, '--report', PROFILE], stdin=subprocess.DEVNULL,
                          stdout=subprocess.PIPE, stderr=subprocess.STDOUT, timeout=LIMIT)
    if not status.exists() or status.read_text().split('\n')[0] != 'success':
        return None, True, done.stdout
    folder, = [entry for entry in reports.iterdir() if entry.name[0].isdigit()]
    shown, facts = contents(folder)
    return shown, bool(facts['incidents']), done.stdout


def counted_calls(options):
    """How often the undisturbed program makes each call, and how often before its own code runs.
    Of several threads or processes, as strace counts each for itself, the one that makes most."""
    with tempfile.NamedTemporaryFile() as file:
        run(['strace', '-qq', '-o', file.name, *options])
        each, loader = collections.Counter(), collections.Counter()
        in_loader = not options
        for line in Path(file.name).read_text(errors='replace').splitlines():
            if match := re.match(r'((?:\d+ +)?)(\w+)\(', line):
                each[match[1], match[2]] += 1
                if in_loader:
                    loader[match[2]] += 1
                # The first thing that the program itself does.
                in_loader = in_loader and 'F_GETFD' not in line
    calls = {}
    for (_, call), count in each.items():
        calls[call] = max(count, calls.get(call, 0))
    return calls, loader


def serve_log(path):
    """A system log that takes everything and keeps nothing."""
    log = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
    log.bind(path)
    threading.Thread(target=lambda: [log.recv(1 << 16) for _ in iter(int, 1)], daemon=True).start()


def inside(args):
    serve_log('/dev/log')
    base = Path(tempfile.mkdtemp(prefix='faults-', dir='/var/tmp'))
    try:
        make_server(base)
        measure(args, base)
    finally:
        shutil.rmtree(base)


def measure(args, base):
    run()
    shown, told, _ = run()
    assert shown is not None and not told, 'the undisturbed run tells something already'
    assert run()[0] == shown, 'two undisturbed runs differ'
    total, untold = collections.Counter(), []
    print(f'{"call":20} {"made":>6} {"failed":>7} {"same":>6} {"told":>6} {"untold":>7}')
    fail_each(args, shown, [], total, untold)
    for folder in (base / 'photos', base / 'photos/of root'):
        print(f'on {folder.relative_to(base)}:')
        fail_each(args, shown, ['-f', '-P', str(folder)], total, untold)
    print(f'{"all":27} {sum(total.values()):7} {total["same"]:6} '
          f'{total["told"]:6} {total["untold"]:7}')
    for call, number, error in untold:
        print(f'untold: {call} number {number} with {error}')


def fail_each(args, shown, options, total, untold):
    """Fails each call that strace sees with these options; prints a line a call."""
    calls, loader = counted_calls(options)
    for call in sorted(calls):
        if call in BEFORE + NEVER or (args.only and call not in args.only):
            continue
        counts = collections.Counter()
        for number in range(loader[call] + 1, calls[call] + 1, args.every):
            # Each call meets one of the errors, its neighbours the others.
            error = args.errors[number % len(args.errors)]
            got, told, output = run(['strace', '-qq', '-o', '/dev/null', *options, '-e',
                                     f'trace={call}', '-e',
                                     f'inject={call}:error={error}:when={number}'])
            outcome = 'same' if got == shown else 'told' if told else 'untold'
            counts[outcome] += 1
            if outcome == 'untold':
                untold.append((call, number, error))
                if args.keep:
                    Path(args.keep, f'{call}-{number}-{error}').write_bytes(
                        output + b'\n'.join(b'-' + part for part in shown if part not in got)
                        + b'\n'.join(b'+' + part for part in got if part not in shown))
        print(f'{call:20} {calls[call]:6} {sum(counts.values()):7} {counts["same"]:6} '
              f'{counts["told"]:6} {counts["untold"]:7}', flush=True)
        total.update(counts)


def main():
    parser = argparse.ArgumentParser(description=__doc__.split('\n')[0])
    parser.add_argument('--build', type=Path, default=ROOT / 'build')
    parser.add_argument('--only', type=lambda text: text.split(','))
    parser.add_argument('--errors', type=lambda text: text.split(','), default=ERRORS.split(','))
    parser.add_argument('--every', type=int, default=1, help='only every Nth call')
    parser.add_argument('--keep', help='a folder for what the runs printed that were not told')
    parser.add_argument('--inside', action='store_true', help=argparse.SUPPRESS)
    args = parser.parse_args()
    global FORMAT
    FORMAT = json.loads((args.build / 'report_format.json').read_text())
    if args.inside:
        inside(args)
        return
    with tempfile.TemporaryDirectory(prefix='faults-', dir='/var/tmp') as stage:
        subprocess.run(['cmake', '--install', args.build], check=True, stdout=subprocess.DEVNULL,
                       env=os.environ | {'DESTDIR': stage})
        tool = Path(stage, 'repquota')
        tool.write_text(QUOTA_TOOL)
        tool.chmod(0o755)
        subprocess.run([ROOT / 'tools/sandbox.sh', '--stage', stage, '--bind', tool,
                        '/usr/sbin/repquota', '--', sys.executable, __file__, '--inside',
                        *sys.argv[1:]], check=True)


if __name__ == '__main__':
    main()
