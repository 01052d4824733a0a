"""What must not end in a report, and what a report must survive."""

import re

from expected import data_rows, facts
from harness import PROGRAM, ProductTest, make_files

PAGE = 4096  # file systems in memory grow by pages
REPORTS = 'share_list,large_file'


class Settings(ProductTest):
    def new_machine(self):
        machine = super().new_machine()
        make_files(machine.share('good'), {'a.jpg': 10})
        return machine

    def test_no_report(self):
        for name, reports, damage, lines in (
                ('no reports', '', None, ['No report selected', ':366 .*create']),
                ('no such report', 'no', None, ['create template failed']),
                ('no file', REPORTS, lambda: self.m.config.unlink(),
                 [r'vornreport\.conf', 'section=weekly', ':352 ']),
                ('no share of use', REPORTS, lambda: self.m.shares.write_text('[007]\npath = /\n'),
                 [r'share\.conf holds no share that can be used; add one']),
                ('no profile', REPORTS, None, ['section=unheard', 'init profile failed']),
                ('no name', REPORTS, None, [r'"\.\./x" is no profile name', 'init profile failed'])):
            with self.subTest(name):
                self.m = self.new_machine()
                self.m.profile('weekly', report_list=reports)
                if damage:
                    damage()
                profile = {'no profile': 'unheard', 'no name': '../x'}.get(name, 'weekly')
                run = self.m.run('--report', profile)
                self.assertEqual(run.status, 0)
                for line in lines:
                    self.assertRegex('\n'.join(run.log_lines), line)
                if profile == 'weekly':
                    self.assertNotEqual(self.m.status('weekly'), 'success')
                self.assertEqual((self.m.report_folders('weekly'), self.m.leftovers()), ([], []))
                if name == 'no share of use':
                    self.m.profile('volumes', report_list='volume_usage')
                    self.m.run('--report', 'volumes')
                    self.assertEqual(self.m.status('volumes'), 'success')

    def test_a_report_all_the_same(self):
        with self.m.shares.open('a') as file:
            for name, path in (('007', '/'), ("it's", '/'), ('relative', 'a/b'), ('gone', '/gone'),
                               ('file', '/etc/hostname'), ('remote', '/proc')):
                file.write(f'[{name}]\npath = {path}\n')
        self.m.profile('weekly', report_list=REPORTS, language='../../x')
        run = self.m.run('--report', 'weekly')
        for line in ('"007" is left out: it is a number', '"it\'s" is left out',
                     '"relative" can\'t be read: its path is not absolute', 'Failed to stat [/gone]',
                     'Failed to stat [/etc/hostname]', 'language "../../x" is no code'):
            self.assertIn(line, '\n'.join(run.log_lines))
        self.assertEqual(self.m.status('weekly'), 'success')
        folder, = self.m.report_folders('weekly')
        told = facts(folder)
        self.assertEqual(({(each['kind'], each['what']) for each in told['incidents']},
                          told['complete']), ({('share_missing', name) for name in (
                              'relative', 'gone', 'file', 'remote', '007', "it's")}, False))
        page = (folder / 'report.html').read_text()
        self.assertIn("\nvar vornLang = 'en';\n", page)
        row, = data_rows(page, 'vornShareListData')
        self.assertRegex(row, "^\\[ 'good', '[^']+', '10' \\]$")


class FullDisks(ProductTest):
    """Every amount of room gives a whole report or none, and a log line in the second case."""

    def run_with_room(self, place, pages):
        self.m = self.new_machine()
        make_files(self.m.share('photos'), {f'{"long " * 20}{i}': i for i in range(300)})
        self.m.profile('weekly', report_list=REPORTS)
        folder = {'/tmp': '/tmp', 'reports': self.m.reports}.get(place, place)
        self.m.options = (['--tmp-size', pages * PAGE] if place == '/tmp' else
                          ['--tmpfs', pages * PAGE, folder])
        # What is found after the run stands behind a mark in the output.
        run = self.m.shell(f'{PROGRAM} --report weekly; echo "== $?"; '
                           'head -n 1 /usr/vorn/var/status/weekly; '
                           f'find {self.m.reports}/weekly -name report.html -exec cat {{}} +')
        word, _, page = run.out.split('\n== 0\n')[1].partition('\n')
        if page:
            self.assertTrue(page.endswith('\n</html>\n'))
            self.assertEqual([len(data_rows(page, f'vorn{report}Data'))
                              for report in ('ShareList', 'LargeFile')], [1, 200])
        # The last word may find no room itself; nothing else may differ from what is there.
        self.assertIn(word, ('success', 'collect_data') if page else ('', 'collect_data', 'fail'))
        # What lists the reports is no part of one.
        lines = [line for line in run.log_lines
                 if not re.search("/(index.html|latest) can't be written", line)]
        self.assertEqual(lines == [], word == 'success', run.log_lines)
        return word

    def test_every_disk(self):
        for place, sizes in (('/tmp', range(1, 180, 7)), ('reports', range(1, 240, 10)),
                             ('/usr/vorn/var/stat', range(1, 110, 6)),
                             ('/usr/vorn/var/status', range(1, 9))):
            words = []
            for pages in sizes:
                with self.subTest(place=place, pages=pages):
                    words.append(self.run_with_room(place, pages))
            # From some size on all is well.
            self.assertEqual(words, sorted(words), place)
            self.assertEqual((words[0] != 'success', words[-1]), (True, 'success'), place)
