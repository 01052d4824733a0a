"""Runs the staged product as a user would, in a private view of the machine.

Nothing here uses the program's own code: outputs are read by small readers of their own.
"""
import os
import re
import shutil
import signal
import socket
import stat
import subprocess
import tempfile
import threading
import time
import unittest
from pathlib import Path

ROOT = Path(__file__).resolve().parents[2]
BUILD = Path(os.environ.get('VORN_BUILD', ROOT / 'build'))
PROGRAM = '/usr/vorn/bin/vornreport'
SCRIPTS = 'usr/vorn/vornreport/reportUI'
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
            # "<11>Nov 21 02:04:26 vornreport: text"
            head, text = re.fullmatch(rb'(<\d+>\w{3} [ \d]\d \d\d:\d\d:\d\d \w+): (.*)', data,
                                      re.DOTALL).groups()
            assert head.startswith(b'<11>') and head.endswith(b' vornreport'), data
            self.lines.append(text.rstrip(b'\0').decode(errors='surrogateescape'))

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
                                        stdin=subprocess.DEVNULL, **streams)

    def pid(self):
        """Waits for the program: the sandbox's only child. Its process id."""
        path = f'/proc/{self.process.pid}/task/{self.process.pid}/children'

        def find():
            for pid in Path(path).read_text().split():
                try:
                    if os.readlink(f'/proc/{pid}/exe').endswith('/vornreport'):
                        return int(pid)
                except FileNotFoundError:
                    pass  # a short-lived child of the sandbox script
            return None
        return wait_for(find, 'the program')

    def signal(self, signo):
        os.kill(self.pid(), signo)

    def read_until(self, text):
        """Reads standard output up to a line that holds `text`."""
        seen = b''
        for line in self.process.stdout:
            seen += line
            if text in line:
                return seen
        raise AssertionError(f'{text} never came; the output was {seen}')

    def finish(self):
        """Waits until the program and whatever holds its output have ended."""
        out, err = self.process.communicate(timeout=LIMIT)
        self.status = self.process.returncode
        self.out, self.err = ((text or b'').decode(errors='surrogateescape') for text in (out, err))
        if isinstance(self.log, Log):
            self.log.close()
            self.log_lines = self.log.lines
        return self


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

    def share(self, name, path=None):
        folder = Path(path or self.base / 'shares' / name)
        folder.mkdir(parents=True, exist_ok=True)
        with self.shares.open('ab') as file:
            file.write(f'[{name}]\npath = {folder}\n'.encode())
        return folder

    def profile(self, name, **keys):
        keys = {'report_dir': self.reports} | keys
        with self.config.open('ab') as file:
            file.write(f'\n[{name}]\n'.encode())
            for key, value in keys.items():
                file.write(f'{key} = {value}\n'.encode(errors='surrogateescape'))

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
        return sorted(path for path in folder.glob('*') if path.name != 'template')

    def leftovers(self):
        """What a run that has ended must not leave: temporary files, databases, partial reports."""
        found = list(self.tmp.glob('vornreport_*')) + list((self.vorn / 'var/stat').iterdir())
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
    echo $$ >/tmp/stopped.new
    mv /tmp/stopped.new /tmp/stopped
    rounds=0
    while [ -e /tmp/stop ] && [ $rounds -lt 600 ]; do
      rounds=$((rounds + 1))
      sleep 0.05
    done
    ;;
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

    def assertSucceeded(self, run, profile):
        self.assertEqual((run.status, run.err, run.log_lines, self.m.status(profile)),
                         (0, '', [], 'success'), run.out)
        self.assertEqual(self.m.leftovers(), [])
        folders = self.m.report_folders(profile)
        self.assertRegex(folders[-1].name, r'^\d{4}-\d\d-\d\d_\d\d-\d\d-\d\d')
        return folders[-1]


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


def regular_files(folder):
    """What a report must count: (path, size) of every regular file, as bytes and number."""
    found = []
    for where, folders, names in os.walk(os.fsencode(folder)):
        folders[:] = [f for f in folders if f != b'@eaDir']
        for name in names:
            status = os.lstat(os.path.join(where, name))
            if name != b'@eaDir' and stat.S_ISREG(status.st_mode):
                found.append((os.path.join(where, name), status.st_size))
    return found


def unescape_js(text):
    """The bytes that the inside of a single-quoted JavaScript string stands for in a page, where a
    lone surrogate \\udcXX stands for the byte XX."""
    plain = {'n': '\n', 't': '\t', 'r': '\r', 'b': '\b', 'f': '\f', 'v': '\v'}

    def replace(match):
        code = match[1] or match[2]
        if code:
            return chr(int(code, 16))
        assert match[3] in plain or match[3] in '\'"\\/', match[0]
        return plain.get(match[3], match[3])
    text = re.sub(r'\\(?:u([0-9a-f]{4})|x([0-9a-f]{2})|(.))', replace, text, flags=re.IGNORECASE)
    return text.encode('utf-8', 'surrogateescape')


def page_rows(page, variable):
    """The rows of a report's block, as lists of bytes; None without the block. The block's frame
    must be exact to the byte."""
    page = Path(page).read_bytes().decode()
    opening = f"<script type='text/javascript'>\nvar {variable} = [\n"
    if opening not in page:
        return None
    block = page.split(opening)[1].split('\n];\n</script>\n')[0]
    rows = []
    for row in block.split(',\n'):
        match = re.fullmatch(r"\[ ('(?:[^'\\\n<]|\\.)*'(?:, '(?:[^'\\\n<]|\\.)*')*) \]", row)
        assert match, row
        rows.append([unescape_js(cell) for cell in re.findall(r"'((?:[^'\\]|\\.)*)'", match[1])])
    return rows


def csv_field(value):
    return b'"' + re.sub(rb'[\n\r\t\v\f]', b' ', value).replace(b'"', b'""') + b'"'


__all__ = ['BUILD', 'LIMIT', 'PROGRAM', 'ROOT', 'SCRIPTS', 'Log', 'Machine', 'ProductTest',
           'csv_field', 'is_alive', 'make_files', 'page_rows', 'regular_files', 'signal',
           'unescape_js', 'wait_for']
