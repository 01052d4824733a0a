"""Pages of real runs in a real browser: what is made here is looked at by tests/page/*.test.mjs."""
import json
import os
import shutil
import subprocess
import tempfile
import time
from pathlib import Path

from expected import Tree
from harness import ALL, BUILD, ROOT, MailServer, ProductTest, make_files, needs_loop_devices
from server import Server

SHARE = 'big & small'
NAMES = {  # name to how it must be shown; chips in brackets
    'plain \u65e5\u672c.txt': None,
    '<img src=x onerror="document.title=1">': None,
    "x'];document.title=1;['.txt": None,
    '<script>document.title=1;<': None,
    '--><!--<script>': None,
    '&amp;&lt;b&gt;': None,
    'back\\slash\\u0041\\n': None,
    '__proto__': None,
    'line\nend\x1b[31m': 'line[U+000A]end[U+001B][31m',
    'tab\tand\r': 'tab[U+0009]and[U+000D]',
    'gnp.\u202egpj.exe': 'gnp.[U+202E]gpj.exe',
    'zero\u200bwidth\u2028\ufeff': 'zero[U+200B]width[U+2028][U+FEFF]',
    'bytes\udcff\udcc3 it\'s': 'bytes[\\xff][\\xc3] it\'s',
}


@needs_loop_devices
class Page(ProductTest):
    def setUp(self):
        super().setUp()
        folder = tempfile.TemporaryDirectory(prefix='vorn-pages-', dir='/var/tmp')
        self.addCleanup(folder.cleanup)
        self.pages = Path(folder.name)

    def make(self, name, grow=None, **keys):
        """Has the machine's report made, as the page `name`; of its growth since before `grow`."""
        self.m.profile(name, report_list=ALL, volume_history='true', **keys)
        if grow:
            self.m.run('--report', name)
            grow()
            time.sleep(1.1)  # reports are called by the second
        run = self.m.run('--report', name)
        self.assertEqual((run.status, self.m.status(name)), (0, 'success'), run.log_lines)
        shutil.copytree(self.m.report_folders(name)[-1], self.pages / name)
        shutil.copy(self.m.reports / name / 'index.html', self.pages / name)
        (self.pages / name / 'status.json').write_text(
            self.m.shell(f'/usr/vorn/bin/vornctl status {name} --json').out)
        self.m = self.new_machine()
        return run.log_lines

    def test_in_the_browser(self):
        server = Server(self.m, self)
        server.history()
        mails = MailServer(self, self.m.base / 'mails')

        def grow():
            server.add(server.root / 'media/Photos', 'to sort/new.raw', 3 << 30, 3001, 0)
            min((server.root / 'media/Videos').rglob('*.mp4'),
                key=lambda path: path.stat().st_size).unlink()
        self.make('big', grow, limit_user='anna,john-doe,chen', mail_to='admin@files.example',
                  smtp_url=f'smtp://127.0.0.1:{mails.port}')
        _, mail = mails.mails()
        (self.pages / 'big/mail.txt').write_text(
            mail['subject'] + '\n' + mail.get_body(('plain',)).get_content())

        self.m.accounts({'root': 0})
        self.m.share('nothing')
        self.make('empty', language='de-AT')

        self.m.accounts({'root': 0, 'john-doe': 3003, '007': 3001})
        tree = Tree(self.m)
        tree.add('docs', 'a/plan.odt', b'plan', owner=3003, days=100)
        tree.add('docs', 'b/plan.odt', b'plan', owner=3001, days=0)
        tree.add(SHARE, 'f', 3 << 30)
        for i, name in enumerate(NAMES):
            tree.add(SHARE, name, 1500 - i)
        folder = self.m.base / 'shares' / SHARE
        (self.pages / 'names.json').write_text(json.dumps(
            [[f'{folder}/{name}', f'{folder}/{shown or name}'] for name, shown in NAMES.items()]))
        self.make('hostile', lambda: tree.add('docs', "it's\nnew", b'plan'), limit_user='john-doe,007', duplicate_compare='true', language='xx')

        # No history can be read or written, and there is no quota tool.
        make_files(self.m.share('docs'), {'a.odt': 7})
        (self.m.vorn / 'etc/vornreport.db').write_text('no database')
        self.m.options += ['--bind', '/bin/false', os.path.realpath('/sbin/repquota')]
        self.assertNotEqual(self.make('broken'), [])

        # Made-up servers, of every kind.
        for kind in ('server', 'huge', 'damaged'):
            subprocess.run([ROOT / 'tools/demo_page.py', self.pages / kind, '--kind', kind, '--build', BUILD],
                           check=True, stdout=subprocess.DEVNULL)

        done = subprocess.run(
            ['node', ROOT / 'tests/page/all.mjs'], stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True,
            env=os.environ | {'VORN_PAGES': str(self.pages), 'VORN_FORMAT': str(BUILD / 'report_format.json'),
                              'VORN_NODE_MODULES': str(BUILD / 'reportUI/page/node_modules')})
        self.assertEqual(done.returncode, 0, done.stdout)
