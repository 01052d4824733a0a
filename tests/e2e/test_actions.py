"""The command line and its actions."""
import unittest

from harness import PROGRAM, ProductTest, make_files, wait_for


class CommandLine(ProductTest):
    def setUp(self):
        super().setUp()
        make_files(self.m.share('photos'), {'a.jpg': 10})
        self.m.profile('weekly', report_list='share_list,large_file')

    def test_data(self):
        self.m.profile('named', report_list='large_file, share_list')
        self.m.profile('nothing', report_list='unheard_of')
        self.m.profile('bare')
        for name, status in (('global', 'collect_data'), ('named', 'success'),
                             ('nothing', 'success'), ('bare', 'collect_data')):
            with self.subTest(name):
                run = self.m.run('--data', name)
                self.assertEqual((run.status, self.m.status(name)), (0, status))
                self.assertEqual(len(run.log_lines), name == 'bare', run.log_lines)
                self.assertEqual(self.m.leftovers(), [])
        self.assertIn('No report selected', run.log_lines[0])

    def test_arguments(self):
        for arguments, reports, logged, err in (
                (['-report', 'weekly'], 1, '', ''),
                (['--report', 'weekly', '--clean'], 1, '', ''),
                (['--clean', 'weekly', '--report'], 0, '', ''),
                (['--report'], 0, r'src/vornreport:340 (\(.*\))?bad parameter\n', ''),
                (['--report', ''], 0, r'src/vornreport:340 (\(.*\))?bad parameter\n', ''),
                (['--data'], 0, r'src/vornreport:409 .*bad parameter\n\n', ''),
                (['--unheard', 'weekly'], 0, '', f"{PROGRAM}: unrecognized option '--unheard'\n"),
                (['weekly'], 0, '', ''),
                ([], 0, '', '')):
            with self.subTest(arguments):
                before = len(self.m.report_folders('weekly'))
                run = self.m.run(*arguments)
                self.assertEqual((run.status, run.err), (0, err))
                self.assertRegex('|'.join(run.log_lines), f'^{logged}$')
                self.assertEqual(len(self.m.report_folders('weekly')) - before, reports)
                self.assertEqual(self.m.leftovers(), [])

    def test_one_report_of_a_profile_at_a_time(self):
        self.m.stop_at('header 2')
        runs = [self.m.start('--report', 'weekly') for _ in range(6)]
        self.m.stopped_pid()
        wait_for(lambda: sum(run.process.poll() is not None for run in runs) == 5, 'five ends')
        self.m.go_on()
        for run in runs:
            run.finish()
            self.assertEqual((run.status, run.log_lines), (0, []))
        skipped = [run for run in runs if 'stat start' not in run.out]
        self.assertEqual(len(skipped), 5)
        for run in skipped:
            self.assertIn('(src/vornreport:345)profile=weekly is running, skip running again\n',
                          run.out)
        self.assertEqual(len(self.m.report_folders('weekly')), 1)
        self.assertEqual((self.m.status('weekly'), self.m.leftovers()), ('success', []))


class Clean(ProductTest):
    CONFIG = b'''# kept: \xff\xfe
[global]
report_list = volume_usage
[ weekly ]
; this comment goes with its section's rewriting or stays, but nothing outside changes
  report_list=share_list
schedule_collect_id = job1
[monthly]
report_list =  large_file
\tschedule_collect_id = job2
# the end, without a line feed'''

    def setUp(self):
        super().setUp()
        self.m.config.write_bytes(self.CONFIG)
        for name in ('vornreport-job1', 'vornreport-job2', 'other'):
            (self.m.cron / name).write_text('0 0 * * * root true\n')

    def cron_files(self):
        return sorted(path.name for path in self.m.cron.iterdir())

    def test_one_profile(self):
        run = self.m.run('--clean', 'weekly')
        self.assertEqual((run.status, run.log_lines), (0, []))
        self.assertEqual(self.cron_files(), ['other', 'vornreport-job2'])
        text = self.m.config.read_bytes()
        start, end = self.CONFIG.index(b'[ weekly ]'), self.CONFIG.index(b'[monthly]')
        self.assertTrue(text.startswith(self.CONFIG[:start]) and text.endswith(self.CONFIG[end:]))
        self.assertEqual((text.count(b'\treport_list = share_list\n'), text.count(b'job1')), (1, 0))

    def test_all_profiles(self):
        stat = self.m.vorn / 'var/stat'
        for name in ('stat.db.weekly', 'stat.db.gone', 'stat.db.gone-journal', 'unrelated'):
            (stat / name).write_text('')
        run = self.m.run('--clean')
        self.assertEqual((run.status, run.log_lines), (0, []))
        self.assertEqual(self.cron_files(), ['other'])
        self.assertEqual([path.name for path in stat.iterdir()], ['unrelated'])
        self.assertNotIn(b'schedule_collect_id', self.m.config.read_bytes())

    def test_what_cannot_be_cleaned(self):
        for name in ('unheard', '../etc'):
            run = self.m.run('--clean', name)
            self.assertRegex('|'.join(run.log_lines), f'Get section failed, section={name}')
        self.assertEqual((self.m.config.read_bytes(), len(self.cron_files())), (self.CONFIG, 3))


if __name__ == '__main__':
    unittest.main()
