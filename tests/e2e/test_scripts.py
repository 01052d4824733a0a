"""The scripts, the sandbox of these tests, and who includes whom."""
import os
import re
import subprocess
import tempfile
import unittest
from pathlib import Path

from harness import ROOT

TEMPLATE = ROOT / 'reportUI/build-template.sh'


def source_files(*folders):
    return [path for folder in folders for path in (ROOT / folder).rglob('*.[ch]*')]


class Sources(unittest.TestCase):
    def test_shellcheck(self):
        scripts = []
        for folder, folders, names in os.walk(ROOT):
            folders[:] = [f for f in folders if not f.startswith(('build', '.git', 'quickstart-'))]
            for path in (Path(folder, name) for name in names):
                if path.suffix == '.sh' or re.match(rb'#!/bin/(ba)?sh\b', path.read_bytes()):
                    scripts.append(path)
        self.assertGreater(len(scripts), 4)
        done = subprocess.run(['shellcheck', '-x', *scripts], cwd=ROOT, text=True,
                              stdout=subprocess.PIPE)
        self.assertEqual(done.stdout, '')

    def test_includes_go_one_way(self):
        report = r'rep_(?!.*\bregistry\.cpp)'
        for folders, forbidden, exempt in (
                (('src', 'include'), r'platform/|host/', ''),
                (('platform',), r'vornreport/|src/|report_frame|file_gathering|rep_', ''),
                (('include',), r'rep_|file_gathering/', ''),
                (('src',), report, r'src/vornreport/registry\.cpp|src/global\.cpp')):
            for path in source_files(*folders):
                name = path.relative_to(ROOT).as_posix()
                if exempt and re.fullmatch(exempt, name):
                    continue
                own = re.escape(path.stem)
                for include in re.findall(r'^\s*#\s*include\s*["<](.*)[">]', path.read_text(),
                                          re.MULTILINE):
                    # A report's own header is its own.
                    if not re.fullmatch(rf'(.*/)?{own}\.(h|hpp)', include):
                        self.assertNotRegex(include, rf'^({forbidden})', name)


class Sandbox(unittest.TestCase):
    def run_in(self, stage, *command):
        return subprocess.run([ROOT / 'tools/sandbox.sh', '--stage', stage, *command], text=True,
                              capture_output=True)

    def test_leaves_the_machine_alone(self):
        watched = ('/usr/vorn', '/etc/cron.d', '/dev/log')
        there_before = [os.path.exists(path) for path in watched]
        with tempfile.TemporaryDirectory() as stage:
            done = self.run_in(stage, '--', 'sh', '-c', 'touch /tmp/mine /etc/cron.d/mine && '
                               'echo 1 >/usr/vorn/mine && test ! -e /dev/log && exit 7')
            self.assertEqual((done.returncode, done.stderr), (7, ''))
            self.assertEqual(Path(stage, 'usr/vorn/mine').read_text(), '1\n')
            done = self.run_in(stage, '--bind', stage, '/not-there', '--', 'true')
            self.assertEqual((done.returncode, os.path.exists('/not-there')), (1, False))
            self.assertEqual(self.run_in(stage, '--unheard').returncode, 2)
        self.assertFalse(os.path.exists('/tmp/mine') or os.path.exists('/etc/cron.d/mine'))
        self.assertEqual([os.path.exists(path) for path in watched], there_before)


class Template(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.file = os.path.join(folder.name, 'part')

    def call(self, *arguments):
        return subprocess.run([TEMPLATE, *arguments], text=True, capture_output=True)

    def test_bad_calls(self):
        for arguments in ((), ('header',), ('unheard', self.file), ('lang', self.file),
                          ('tail', self.file, 'x'), ('header', self.file, ''),
                          ('lang', self.file, "x';alert(1)"), ('body', self.file, '<b>'),
                          ('header', self.file, 'a', 'b')):
            with self.subTest(arguments):
                done = self.call(*arguments)
                self.assertEqual(done.returncode, 2)
                self.assertIn('\nusage: ', done.stderr)
                self.assertFalse(os.path.exists(self.file))

    def test_parts_that_are_not_there(self):
        for command, *word in (('lang', 'en'), ('header', 'x'), ('body', 'x'), ('tail',)):
            with self.subTest(command):
                self.assertEqual(self.call(command, self.file, *word).returncode, 1)
                self.assertFalse(os.path.exists(self.file))
        Path(self.file).write_text('<main>\ncut sho')
        # The page itself is emptied: what is added to a damaged one must never make it look whole.
        for command, word, left in (('body', ['x'], '<main>\ncut sho'),
                                    ('tail', [], '<main>\ncut sho'), ('lang', ['en'], '')):
            self.assertEqual(self.call(command, self.file, *word).returncode, 1)
            self.assertEqual(Path(self.file).read_text(), left)

    def test_links_are_not_followed(self):
        os.symlink(self.file + '2', self.file)
        for command in ('header', 'body', 'tail'):
            self.assertEqual(self.call(command, self.file).returncode, 1)
        self.assertFalse(os.path.exists(self.file + '2'))


class Quickstart(unittest.TestCase):
    def test_bad_folders(self):
        with tempfile.TemporaryDirectory() as folder:
            os.mkdir(os.path.join(folder, "it's"))
            for name, message in (('gone', 'no such folder'), ("it's", 'single quote')):
                done = subprocess.run([ROOT / 'quickstart.sh', os.path.join(folder, name)],
                                      text=True, capture_output=True)
                self.assertEqual((done.returncode, done.stdout), (1, ''))
                self.assertRegex(done.stderr, f'^quickstart.sh: .*{message}.*\n$')


if __name__ == '__main__':
    unittest.main()
