"""The command line, its actions and the mail."""
import json
import re

from harness import PROGRAM, MailServer, ProductTest, make_files, wait_for


class CommandLine(ProductTest):
    def setUp(self):
        super().setUp()
        make_files(self.m.share('photos'), {'a.jpg': 10})
        self.m.profile('weekly', report_list='share_list,large_file')

    def test_arguments(self):
        self.m.profile('nothing', report_list='unheard_of')
        self.m.profile('bare')
        bad = r'(\(.*\))?bad parameter\n'
        for arguments, reports, logged, err in (
                ('-report weekly', 1, '', ''),
                ('--report weekly --clean', 1, '', ''),
                ('--clean weekly --report', 0, '', ''),
                ('--report', 0, f'src/vornreport:340 {bad}', ''),
                ("--report ''", 0, f'src/vornreport:340 {bad}', ''),
                ('--data', 0, f'src/vornreport:409 {bad}\n', ''),
                ('--data global', 0, '', ''),
                ('--data weekly', 0, '', ''),
                ('--data nothing', 0, '', ''),
                ('--data bare', 0, '.*No report selected.*\n+',
                 'vornreport: .*No report selected\nvornreport: the run of profile bare failed; .*\n'),
                ('--unheard weekly', 0, '', f"{PROGRAM}: unrecognized option '--unheard'\n"),
                ('weekly', 0, '', ''),
                ('', 0, '', '')):
            with self.subTest(arguments):
                before = len(self.m.report_folders('weekly'))
                run = self.m.shell(f'exec {PROGRAM} {arguments}')
                self.assertRegex(f'{run.status} {run.err}', f'^0 {err}$')
                self.assertRegex('|'.join(run.log_lines), f'^{logged}$')
                self.assertEqual(len(self.m.report_folders('weekly')) - before, reports)
                self.assertEqual(self.m.leftovers(), [])
        self.assertEqual([self.m.status(name) for name in ('global', 'weekly', 'nothing', 'bare')],
                         ['collect_data', 'success', 'success', 'collect_data'])

    def test_one_report_of_a_profile_at_a_time(self):
        self.m.stop_at('header 2')
        runs = [self.m.start('--report', 'weekly') for _ in range(6)]
        self.m.stopped_pid()
        wait_for(lambda: sum(run.process.poll() is not None for run in runs) == 5, 'five ends')
        self.m.go_on()
        for run in runs:
            run.finish()
            self.assertEqual((run.status, run.log_lines), (0, []))
        skipped = '(src/vornreport:345)profile=weekly is running, skip running again\n'
        self.assertEqual(sorted((skipped in run.out, 'stat start' in run.out) for run in runs),
                         [(False, True)] + [(True, False)] * 5)
        self.assertEqual(len(self.m.report_folders('weekly')), 1)
        self.assertEqual((self.m.status('weekly'), self.m.leftovers()), ('success', []))


class Clean(ProductTest):
    def test_clean(self):
        parts = {
            'head': b'# kept: \xff\xfe\n[global]\nreport_list = volume_usage\n',
            'weekly': b'[ weekly ]\n; kept, too\n  report_list=share_list\nschedule_collect_id = job1\n',
            'monthly': b'[monthly]\nreport_list =  large_file\n\tschedule_collect_id = job2\n',
            'unscheduled': b'[daily]\n  report_list=share_list\n',
            'end': b'# without a line feed'}
        weekly = {'weekly': b'[ weekly ]\n; kept, too\n\treport_list = share_list\n'}
        both = weekly | {'monthly': b'[monthly]\n\treport_list = large_file\n'}
        schedules = {'other', 'vornreport-job1', 'vornreport-job2'}
        databases = {'stat.db.weekly', 'stat.db.gone', 'stat.db.gone-journal'}
        for arguments, logged, cron, stat, changed in (
                (['weekly'], '', {'vornreport-job1'}, {'stat.db.weekly'}, weekly),
                ([], '', {'vornreport-job1', 'vornreport-job2'}, databases, both),
                (['unheard'], 'Get section failed, section=unheard', set(), set(), {}),
                (['../etc'], 'Get section failed, section=../etc', set(), set(), {})):
            with self.subTest(arguments):
                self.m = self.new_machine()
                self.m.config.write_bytes(b''.join(parts.values()))
                for name in schedules:
                    (self.m.cron / name).write_text('0 0 * * * root true\n')
                for name in (*databases, 'kept'):
                    (self.m.vorn / 'var/stat' / name).write_text('')
                run = self.m.run('--clean', *arguments)
                self.assertEqual((run.status, len(run.log_lines)), (0, int(bool(logged))))
                self.assertIn(logged, ''.join(run.log_lines))
                self.assertEqual({path.name for path in self.m.cron.iterdir()}, schedules - cron)
                self.assertEqual({path.name for path in (self.m.vorn / 'var/stat').iterdir()},
                                 databases - stat | {'kept'})
                self.assertEqual(self.m.config.read_bytes(), b''.join((parts | changed).values()))
        as_nobody = f'exec setpriv --reuid 65534 --regid 65534 --clear-groups {PROGRAM} --clean'
        self.assertRegex(self.m.shell(as_nobody).err, '^vornreport: .*; run this as root\n')


class Mail(ProductTest):
    def test_the_mail_of_a_run(self):
        files = {'a/same.bin': 3 << 20, 'b/same.bin': 3 << 20, 'c/same.bin': 3 << 20, 'a/x': 5}
        make_files(self.m.share('photos'), files)
        make_files(self.m.share('small'), {'y': 1024})
        server = MailServer(self, self.m.base / 'mails')
        self.m.profile('weekly', report_list='volume_usage,share_list,duplicate_file', language='de',
                       keep_reports=1, mail_to='a@example.com',
                       smtp_url=f'smtp://127.0.0.1:{server.port}')
        for _ in range(2):
            folder = self.assertSucceeded(self.m.run('--report', 'weekly'), 'weekly')
        self.assertEqual(self.m.report_folders('weekly'), [folder])
        self.assertEqual(self.m.shell('exec /usr/vorn/bin/vornctl profile test-mail weekly').out,
                         'sent to a@example.com\n')

        first, last, test = server.mails()
        self.assertIn('Dies ist ein Test', test.get_body(('plain',)).get_content())
        facts = json.loads((folder / 'report.json').read_text())
        # Whatever this machine's own volumes are like.
        urgent = [entry for entry in facts['attention'] if entry['level'] != 'ok']
        self.assertIn(urgent[0]['values']['volume'] if urgent else 'Speicherbericht', last['Subject'])
        self.assertIn('peicherbericht weekly von ', last['Subject'])
        volume = facts['volumes'][0]
        percent = f"{min(volume['percent'], 99.9):.1f}".removesuffix('.0').replace('.', ',')
        lines = [re.escape(f"Dringendstes Volume: {volume['path']} ({percent}\xa0%), "),
                 '.*photos.*9\xa0MiB', '.*6\xa0MiB',
                 'Berichte: Volumes, Freigaben, Doppelte Dateien$']
        text = last.get_body(('plain',)).get_content()
        html = last.get_body(('html',)).get_content()
        self.assertIn(f'file://{folder}/report.html\r\n', text)
        for shown in (text, re.sub('<[^>]*>', '', re.sub('</th>', ': ', html))):
            for line in lines:
                self.assertRegex(shown.replace('\r\n', '\n'), re.compile(f'^{line}', re.MULTILINE))
        self.assertNotEqual(first['Message-ID'], last['Message-ID'])
