"""Runs the staged product as a user would, in a private view of the machine.

Nothing here uses the program's own code: outputs are read by small readers of their own.
"""
import ctypes
import email
import email.policy
import fcntl
import json
import os
import re
import shutil
import signal
import socket
import sqlite3
import subprocess
import tempfile
import threading
import time
import unittest
from pathlib import Path

ROOT = Path(__file__).resolve().parents[2]
BUILD = Path(os.environ.get('VORN_BUILD', ROOT / 'build'))
PROGRAM, CTL = '/usr/vorn/bin/vornreport', '/usr/vorn/bin/vornctl'
SCRIPTS = 'usr/vorn/vornreport/reportUI'
FORMAT = json.loads((BUILD / 'report_format.json').read_text())
ALL = ','.join(report['name'] for report in FORMAT['reports'])  # the whole list of reports
LIMIT = 30  # seconds that no run of these tests comes near


class Log:
    """A system log: collects what is sent to a datagram socket."""

    def __init__(self, path):
        self.lines = []
        self._path = str(path)
        self._socket = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
        self._socket.bind(self._path)
        os.chmod(self._path, 0o666)
        self._thread = threading.Thread(target=self._collect, daemon=True)
        self._thread.start()

    def _collect(self):
        while (data := self._socket.recv(1 << 16)) != b'stop':
            text = re.fullmatch(rb'<11>\w{3} [ \d]\d \d\d:\d\d:\d\d vornreport: (.*?)\0*', data,
                                re.DOTALL)
            self.lines.append(text[1].decode(errors='surrogateescape') if text else repr(data))

    def close(self):
        """All that was sent before this call is in `lines` afterwards."""
        if self._thread.is_alive():
            with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as sender:
                sender.sendto(b'stop', self._path)
            self._thread.join(LIMIT)
        self._socket.close()


class Run:
    """A started program."""

    def __init__(self, machine, command, log, **streams):
        self.log = log
        streams = {'stdout': subprocess.PIPE, 'stderr': subprocess.PIPE} | streams
        self.process = subprocess.Popen(machine.sandbox(log) + ['--', *command],
                                        **({'stdin': subprocess.DEVNULL} | streams))

    def pid(self, program='vornreport'):
        """Waits for the program: the sandbox's only child. Its process id."""
        path = f'/proc/{self.process.pid}/task/{self.process.pid}/children'

        def find():
            for pid in Path(path).read_text().split():
                try:
                    if os.readlink(f'/proc/{pid}/exe').endswith(f'/{program}'):
                        return int(pid)
                except FileNotFoundError:
                    pass  # a short-lived child of the sandbox script
            return None
        return wait_for(find, 'the program')

    def finish(self):
        """Waits until the program and whatever holds its output have ended."""
        out, err = self.process.communicate(timeout=LIMIT)
        self.status = self.process.returncode
        self.out, self.err = ((text or b'').decode(errors='surrogateescape') for text in (out, err))
        if isinstance(self.log, Log):
            self.log.close()
            self.log_lines = self.log.lines
        return self


class MailServer:
    """A mail server on loopback; mails() are those that it was given."""

    def __init__(self, test, folder):
        self.folder = folder
        folder.mkdir()
        self.process = subprocess.Popen(
            ['/usr/bin/python3', ROOT / 'tests/platform/smtp_server.py', folder],
            stdout=subprocess.PIPE, text=True)
        test.addCleanup(self.end)
        self.port = int(self.process.stdout.readline())

    def end(self):
        self.process.send_signal(signal.SIGTERM)
        self.process.wait()
        self.process.stdout.close()

    def mails(self):
        files = sorted(self.folder.glob('*.eml'), key=lambda path: int(path.stem))
        return [email.message_from_bytes(path.read_bytes(), policy=email.policy.default)
                for path in files]


class Machine:
    """A machine with the product installed: a stage, a /tmp, shares and a report folder."""

    def __init__(self, base, stage):
        self.base, self.stage = Path(base), Path(base, 'stage')
        shutil.copytree(stage, self.stage, symlinks=True)
        self.vorn = self.stage / 'usr/vorn'
        self.config, self.shares = (self.vorn / 'etc' / f'{name}.conf'
                                    for name in ('vornreport', 'share'))
        self.tmp, self.cron, self.reports = (self.base / name for name in ('tmp', 'cron', 'reports'))
        for folder in (self.tmp, self.cron, self.reports):
            folder.mkdir()
        self.options = []  # for the sandbox, besides those for the folders above
        self._logs = 0

    def share(self, name, path=None, inside=False):
        """A share, whose folder is made, unless the sandbox alone has it."""
        folder = Path(path or self.base / 'shares' / name)
        if not inside:
            folder.mkdir(parents=True, exist_ok=True)
        with self.shares.open('ab') as file:
            file.write(os.fsencode(f'[{name}]\npath = {folder}\n'))
        return folder

    def history(self, sql, *values):
        """The rows that a statement gives on the history database."""
        with sqlite3.connect(self.vorn / 'etc/vornreport.db') as db:
            db.text_factory = lambda text: text.decode(errors='surrogateescape')
            rows = db.execute(sql, values).fetchall()
        db.close()
        return rows

    def samples(self, rows):
        """Makes the history database with samples: profile, volume, used, free, percent, date."""
        with sqlite3.connect(self.vorn / 'etc/vornreport.db') as db:
            db.executescript((self.vorn / 'vornreport/sql/vornreport.sql').read_text())
            db.executemany('INSERT INTO VolumeUsage VALUES (?, ?, ?, ?, ?, ?)',
                           [tuple(map(str, row)) for row in rows])
        db.close()

    def profile(self, name, **keys):
        keys = {'report_dir': self.reports} | keys
        with self.config.open('ab') as file:
            file.write(f'\n[{name}]\n'.encode())
            for key, value in keys.items():
                file.write(f'{key} = {value}\n'.encode(errors='surrogateescape'))

    def accounts(self, accounts):
        """Lets only these users, name to number, be known."""
        for name, text in (('group', 'root:x:0:\n'), ('passwd', ''.join(
                f'{user}:x:{uid}:0::/:/bin/sh\n' for user, uid in accounts.items()))):
            (self.base / name).write_text(text)
            self.options += ['--bind', self.base / name, f'/etc/{name}']

    def sandbox(self, log=None):
        options = ['--stage', self.stage, '--cron', self.cron, *self.options]
        if '--tmp-size' not in options:
            options += ['--tmp', self.tmp]
        if log is not None:
            options += ['--log', log._path if isinstance(log, Log) else log]
        return [str(ROOT / 'tools/sandbox.sh'), *map(str, options)]

    def new_log(self):
        self._logs += 1
        return Log(self.base / f'log{self._logs}')

    def start(self, *arguments, log='new', **streams):
        return Run(self, [PROGRAM, *arguments], self.new_log() if log == 'new' else log, **streams)

    def run(self, *arguments, **options):
        return self.start(*arguments, **options).finish()

    def shell(self, script, **options):
        """Runs a shell script in the product's place."""
        return Run(self, ['/bin/sh', '-c', script], self.new_log(), **options).finish()

    def status(self, profile):
        return (self.vorn / 'var/status' / profile).read_text().splitlines()[0]

    def report_folders(self, profile):
        folder = self.reports / profile
        return sorted(folder.glob('[0-9]*'))

    def leftovers(self):
        """What a run that has ended must not leave: temporary files, databases, progress, partial
        reports."""
        found = list(self.tmp.glob('vornreport_*')) + [
            path for name in ('stat', 'progress') for path in (self.vorn / 'var' / name).rglob('*')
            if not path.is_dir()]
        return found + list(self.reports.glob('*/.*partial'))

    def stop_at(self, call):
        """Makes the template script wait at `call` ("lang", "body 2"...: the sub-command and, if
        wanted, the number of all arguments) until go_on()."""
        script = self.stage / SCRIPTS / 'build-template.sh'
        original = script.with_name('original.sh')
        if not original.exists():
            script.rename(original)
            script.write_text(f'''#!/bin/sh
case "$1 $#" in
  "$(cat /tmp/stop 2>/dev/null || echo nowhere)"*)
    echo $$ >/tmp/new && mv /tmp/new /tmp/stopped
    for i in $(seq 600); do [ ! -e /tmp/stop ] || sleep 0.05; done ;;
esac
exec /{SCRIPTS}/original.sh "$@"
''')
            script.chmod(0o755)
        (self.tmp / 'stopped').unlink(missing_ok=True)
        (self.tmp / 'stop').write_text(call)

    def stopped_pid(self):
        """Waits for the stop; the process id of the script."""
        stopped = self.tmp / 'stopped'
        wait_for(stopped.exists, 'the stop')
        return int(stopped.read_text())

    def go_on(self):
        (self.tmp / 'stopped').unlink()
        (self.tmp / 'stop').unlink()


class ProductTest(unittest.TestCase):
    """Stages the product once per class and gives each test a fresh machine."""

    @classmethod
    def setUpClass(cls):
        cls._stage = tempfile.TemporaryDirectory(prefix='vorn-stage-', dir='/var/tmp')
        cls.addClassCleanup(cls._stage.cleanup)
        subprocess.run(['cmake', '--install', str(BUILD)], check=True, stdout=subprocess.DEVNULL,
                       env=os.environ | {'DESTDIR': cls._stage.name})

    def setUp(self):
        self.m = self.new_machine()

    def new_machine(self):
        base = tempfile.TemporaryDirectory(prefix='vorn-', dir='/var/tmp')
        self.addCleanup(base.cleanup)
        return Machine(base.name, self._stage.name)

    def assertSucceeded(self, run, profile, err=''):
        self.assertRegex(run.err, f'^{err}$')
        self.assertEqual((run.status, run.log_lines, self.m.status(profile)), (0, [], 'success'),
                         run.out)
        self.assertEqual(self.m.leftovers(), [])
        folders = self.m.report_folders(profile)
        self.assertRegex(folders[-1].name, r'^\d{4}-\d\d-\d\d_\d\d-\d\d-\d\d')
        return folders[-1]


class CtlTest(ProductTest):
    def ctl(self, *arguments, log=None):
        run = Run(self.m, [CTL, *arguments], log).finish()
        self.assertNotIn('terminate called', run.err)
        return run

    def check(self, arguments, status=0, err='', out=''):
        run = self.ctl(*arguments)
        self.assertEqual(run.status, status, run.out + run.err)
        self.assertRegex(run.out, f'^{out}$')
        self.assertRegex(run.err, f'^vornctl: .*{err}.*\n$' if err else '^$')


def call(*command, **options):
    """What a command prints, which must succeed."""
    done = subprocess.run(list(map(str, command)), stdin=subprocess.DEVNULL, text=True,
                          stdout=subprocess.PIPE, stderr=subprocess.STDOUT, **options)
    assert done.returncode == 0, f'{command}: {done.returncode}\n{done.stdout}'
    return done.stdout


def mount_image(test, folder, size, *features, options='loop'):
    """Mounts a new ext4 of `size` bytes as `folder`, until the test ends; its device."""
    image = folder.with_suffix('.image')
    folder.mkdir(parents=True)
    with image.open('wb') as file:
        file.truncate(size)
    call('mkfs.ext4', '-q', *features, image)
    call('mount', '-o', options, image, folder)
    test.addCleanup(call, 'umount', folder)
    return call('findmnt', '-n', '-o', 'SOURCE', folder).strip()


def wait_for(condition, what):
    end = time.monotonic() + LIMIT
    while time.monotonic() < end:
        if result := condition():
            return result
        time.sleep(0.005)
    raise AssertionError(f'{what} never came')


def is_alive(pid):
    try:
        return Path(f'/proc/{pid}/stat').read_text().rsplit(')', 1)[1].split()[0] != 'Z'
    except (FileNotFoundError, ProcessLookupError):
        return False


def make_files(folder, files):
    """Makes sparse files: path below `folder` (text or bytes) to size."""
    for path, size in files.items():
        full = os.path.join(os.fsencode(folder), os.fsencode(path))
        os.makedirs(os.path.dirname(full), exist_ok=True)
        with open(full, 'wb') as file:
            file.truncate(size)


def private_mounts():
    """Whatever this process mounts from now on, no other sees, and it goes with this one."""
    new_namespace = 0x20000
    if ctypes.CDLL(None, use_errno=True).unshare(new_namespace):
        raise OSError(ctypes.get_errno(), 'unshare')
    subprocess.run(['mount', '--make-rprivate', '/'], check=True)


def needs_root(test):
    """For tests of what a plain user's machine can't have; a server's, and the build's, must."""
    return unittest.skipIf(os.geteuid(), 'only root can give files away and mount')(test)


def needs_loop_devices(test):
    """For tests that mount an image; a container may have no devices for that."""
    get_free = 0x4C82
    try:
        with open('/dev/loop-control', 'rb') as control:
            number = fcntl.ioctl(control, get_free)
        with open(f'/dev/loop{number}', 'rb'):
            return needs_root(test)
    except OSError as error:
        return needs_root(unittest.skip(
            f'no loop devices to mount images with ({error.filename}: {error.strerror}); '
            'run modprobe loop, and let a container have /dev/loop-control and /dev/loop*')(test))
