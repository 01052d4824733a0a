"""The scripts, and who includes whom."""
import os
import re
import subprocess
import tempfile
import unittest
from pathlib import Path

from harness import ROOT

TEMPLATE = ROOT / 'reportUI/build-template.sh'


class Sources(unittest.TestCase):
    def test_shellcheck(self):
        scripts = []
        for folder, folders, names in os.walk(ROOT):
            folders[:] = [f for f in folders if not f.startswith((
                'build', '.git', 'quickstart-', 'node_modules'))]
            for path in (Path(folder, name) for name in names):
                if path.suffix in ('.sh', '.bash') or re.match(rb'#!/bin/(ba)?sh\b', path.read_bytes()):
                    scripts.append(path)
        self.assertGreater(len(scripts), 4)
        done = subprocess.run(['shellcheck', '-x', *scripts], cwd=ROOT, text=True,
                              stdout=subprocess.PIPE)
        self.assertEqual(done.stdout, '')

    def test_includes_go_one_way(self):
        for folder, forbidden, exempt in (
                ('src', r'platform/|host/', ''), ('include', r'platform/|host/', ''),
                ('platform', r'vornreport/|src/|report_frame|file_gathering|rep_', ''),
                ('include', r'rep_|file_gathering/', ''), ('ctl', r'src/|rep_|file_gathering/', ''),
                ('src', r'rep_', r'registry\.cpp|global\.cpp')):
            for path in (ROOT / folder).rglob('*.[ch]*'):
                for include in re.findall(r'^\s*#\s*include\s*["<](.*)[">]', path.read_text(),
                                          re.MULTILINE):
                    # A report's own header is its own.
                    if not (re.fullmatch(exempt, path.name) or Path(include).stem == path.stem):
                        self.assertNotRegex(include, rf'^({forbidden})', path)


class Template(unittest.TestCase):
    def test_calls_that_must_not_make_a_page(self):
        cut = '<main>\ncut sho'
        for arguments, status, before, after in (
                # What can't be understood is not done.
                ('', 2, None, None), ('header', 2, None, None), ('unheard FILE', 2, None, None),
                ('lang FILE', 2, None, None), ('tail FILE x', 2, None, None),
                ("lang FILE x';alert(1)", 2, None, None), ('body FILE <b>', 2, None, None),
                ('header FILE a b', 2, None, None),
                # Parts that are not there.
                ('lang FILE en', 1, None, None), ('header FILE x', 1, None, None),
                ('body FILE x', 1, None, None), ('tail FILE', 1, None, None),
                # The page itself is emptied: what is added to it must never make it look whole.
                ('body FILE x', 1, cut, cut), ('tail FILE', 1, cut, cut), ('lang FILE en', 1, cut, ''),
                # Links are not followed.
                *((f'{command} FILE', 1, 'link', None) for command in ('header', 'body', 'tail'))):
            with self.subTest(arguments, before=before), tempfile.TemporaryDirectory() as folder:
                file = Path(folder, 'part')
                if before == 'link':
                    file.symlink_to(Path(folder, 'elsewhere'))
                elif before is not None:
                    file.write_text(before)
                done = subprocess.run([TEMPLATE, *arguments.replace('FILE', str(file)).split()],
                                      text=True, capture_output=True)
                self.assertEqual(done.returncode, status)
                self.assertEqual('\nusage: ' in done.stderr, status == 2)
                self.assertEqual(file.read_text() if file.exists() else None, after)
