"""The one-command start on a copy of the sources, as a newcomer would use it."""
import shutil
import subprocess
import tempfile
import unittest
from pathlib import Path

from harness import ROOT


class Quickstart(unittest.TestCase):
    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix='vorn-', dir='/var/tmp'))
        self.addCleanup(shutil.rmtree, self.folder)
        self.clone = self.folder / 'clone'
        made = ('build', 'build-', '.git', 'quickstart-report')
        shutil.copytree(ROOT, self.clone, symlinks=True, ignore=lambda folder, names: [
            name for name in names if Path(folder) == ROOT and name.startswith(made)])

    def quickstart(self, *folders):
        return subprocess.run([self.clone / 'quickstart.sh', *folders], cwd=self.folder, text=True,
                              capture_output=True)

    def test_reports_on_folders_twice(self):
        shares = [self.folder / 'Büro & Fotos', self.folder / '2024']
        for share in shares:
            # Enough files that their lists don't fit into a pipe at once.
            for number in range(2000):
                path = share / f'folder {number % 20}' / f'a rather long file name {number}.txt'
                path.parent.mkdir(parents=True, exist_ok=True)
                path.write_bytes(b'x' * (number % 7))
            with (share / 'largest of all').open('wb') as file:
                file.truncate(5 << 30)
        (self.folder / "it's").mkdir()
        for name, message in (('gone', 'no such folder'), ("it's", 'single quote')):
            done = self.quickstart(name)
            self.assertEqual((done.returncode, done.stdout), (1, ''))
            self.assertRegex(done.stderr, f'^quickstart.sh: .*{message}.*\n$')
        pages = set()
        for _ in range(2):
            done = self.quickstart('Büro & Fotos', shares[1])
            self.assertEqual(done.returncode, 0, done.stdout + done.stderr)
            page = Path(done.stdout.splitlines()[-1])
            pages.add(page)
            self.assertTrue(page.is_relative_to(self.clone), page)
            text = page.read_text()
            self.assertTrue(text.endswith('</html>\n'))
            for share in shares:
                self.assertIn(f"'{share}/largest of all', '5368709120' ]", text)
        self.assertEqual(len(pages), 2)
