"""What must not end in a report, and what a report must survive."""
import unittest

from harness import PROGRAM, SCRIPTS, ProductTest, make_files, page_rows

PAGE = 4096  # file systems in memory grow by pages
REPORTS = 'share_list,large_file'


class Refused(ProductTest):
    def assertFailed(self, run, lines):
        """No report, no word of success, and each of `lines` in the log."""
        self.assertEqual(run.status, 0)
        log = '\n'.join(run.log_lines)
        for line in lines:
            self.assertRegex(log, line)
        self.assertNotEqual(self.m.status('weekly'), 'success')
        self.assertEqual(self.m.report_folders('weekly'), [])
        self.assertEqual(self.m.leftovers(), [])

    def test_settings(self):
        config, script = 'etc/vornreport.conf', f'../../{SCRIPTS}/build-template.sh'
        for name, keys, damage, lines in (
                ('quote', {'report_dir': "/var/tmp/it's"}, None,
                 ['report_dir "/var/tmp/it\'s" holds a single quote', 'src/vornreport:313 ']),
                ('file', {'report_dir': '/etc/hostname/x'}, None, [r'can\'t be made \(Not a dir']),
                ('no reports', {'report_list': ''}, None, ['No report selected', ':366 .*create']),
                ('no such report', {'report_list': 'no'}, None, ['create template failed']),
                ('no file', {}, (config, None), [r'vornreport\.conf', 'section=weekly', ':352 ']),
                ('bad line', {}, (config, f'[weekly]\nreport_list = {REPORTS}\nword\n'),
                 [r'vornreport\.conf:3: malformed line', 'section=weekly']),
                ('no shares', {}, ('etc/share.conf', None), [r'share\.conf can\'t be read']),
                ('no script', {}, (script, None), ['page .* is missing or cut', 'no link to']),
                ('bad script', {}, (script, '#!/bin/sh\nexit 1\n'), ['page .* is missing or cut'])):
            with self.subTest(name):
                self.m = self.new_machine()
                make_files(self.m.share('photos'), {'a.jpg': 10})
                self.m.profile('weekly', **{'report_list': REPORTS} | keys)
                if damage:
                    path = self.m.vorn / damage[0]
                    path.unlink()
                    if damage[1]:
                        path.write_text(damage[1])
                        path.chmod(0o755)
                self.assertFailed(self.m.run('--report', 'weekly'), lines)

    def test_names_of_profiles(self):
        for name, first, count in (('unheard', 'section=unheard', 2),
                                   ('../x', '"../x" is no profile name', 3)):
            with self.subTest(name):
                run = self.m.run('--report', name)
                self.assertEqual((run.status, len(run.log_lines)), (0, count))
                self.assertIn(first, run.log_lines[0])
                self.assertIn('init profile failed', run.log_lines[-1])
                self.assertEqual(list(self.m.reports.iterdir()), [])


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
        result = run.out.split('\n== 0\n')[1].split('\n', 1)
        word, page = result[0], result[1] if len(result) > 1 else ''
        if page:
            page_file = self.m.base / 'page'
            page_file.write_text(page)
            self.assertTrue(page.endswith('\n</html>\n'))
            self.assertEqual(len(page_rows(page_file, 'vornShareListData')), 1)
            self.assertEqual(len(page_rows(page_file, 'vornLargeFileData')), 200)
        # The last word may find no room itself; nothing else may differ from what is there.
        self.assertIn(word, ('success', 'collect_data') if page else ('', 'collect_data', 'fail'))
        self.assertEqual(run.log_lines == [], word == 'success')
        return word

    def test_every_disk(self):
        for place, sizes in (('/tmp', range(1, 40, 2)), ('reports', range(1, 60, 3)),
                             ('/usr/vorn/var/stat', range(1, 40, 4)),
                             ('/usr/vorn/var/status', range(1, 9))):
            words = []
            for pages in sizes:
                with self.subTest(place=place, pages=pages):
                    words.append(self.run_with_room(place, pages))
            # From some size on all is well.
            self.assertEqual(words, sorted(words), place)
            self.assertEqual((words[0] != 'success', words[-1]), (True, 'success'), place)


class Survived(ProductTest):
    def test_shares_that_cannot_be_read(self):
        good = self.m.share('good')
        make_files(good, {'a.jpg': 10})
        with self.m.shares.open('a') as file:
            for name, path in (('007', good), ("it's", good), ('relative', 'a/b'),
                               ('gone', self.m.base / 'gone'), ('file', '/etc/hostname'),
                               ('remote', '/proc')):
                file.write(f'[{name}]\npath = {path}\n')
        self.m.profile('weekly', report_list=REPORTS)
        run = self.m.run('--report', 'weekly')
        self.assertEqual(self.m.status('weekly'), 'success')
        page = self.m.report_folders('weekly')[0] / 'report.html'
        self.assertEqual([row[0] for row in page_rows(page, 'vornShareListData')], [b'good'])
        log = '\n'.join(run.log_lines)
        for line in ('"007" is left out: it is a number', '"it\'s" is left out',
                     '"relative" can\'t be read: its path is not absolute',
                     r'Failed to stat \[.*/gone\]', r'Failed to stat \[/etc/hostname\]'):
            self.assertRegex(log, line)

    def test_other_settings(self):
        make_files(self.m.share('good'), {'a.jpg': 10})
        for name, keys, line, lang in (
                ('lang', {'language': '../../x'}, 'language "../../x" is no code', 'en'),
                ('typo', {'share_list': 'good,god'}, 'share_list names "god"', 'en'),
                ('mail', {'mail_to': 'a@b.c', 'smtp_url': 'smtp://127.0.0.1:1'},
                 'send mail failed, profile=mail', 'en')):
            with self.subTest(name):
                self.m.profile(name, **{'report_list': REPORTS} | keys)
                run = self.m.run('--report', name)
                self.assertIn(line, '\n'.join(run.log_lines))
                self.assertEqual(self.m.status(name), 'success')
                page = (self.m.report_folders(name)[0] / 'report.html').read_text()
                self.assertIn(f"\n  lang: '{lang}',\n", page)


if __name__ == '__main__':
    unittest.main()
