"""Who is told of a run without asking: by mail, on standard error, by the status, in metrics."""
import json
import os
import re
import shlex
import signal
import subprocess
import time

from expected import facts
from harness import CTL, MailServer, ProductTest, Run, make_files, needs_root

DAY = 86400


class TellingTest(ProductTest):
    def new_machine(self):
        machine = super().new_machine()
        make_files(machine.share('photos'), {'a.jpg': 10})
        return machine

    def mailed(self, profile='weekly', **keys):
        """A profile that mails; its server."""
        server = MailServer(self, self.m.base / 'mails')
        self.m.profile(profile, **{'report_list': 'share_list', 'mail_to': 'ann@localhost',
                                   'smtp_url': f'smtp://localhost:{server.port}'} | keys)
        return server

    def status(self, profile='weekly'):
        run = Run(self.m, [CTL, 'status', profile, '--json'], None).finish()
        return json.loads(run.out)[0], Run(self.m, [CTL, 'status', profile], None).finish().out

    def kill(self, profile='weekly'):
        self.m.stop_at('lang')
        run = self.m.start('--report', profile)
        self.m.stopped_pid()
        os.kill(run.pid(), signal.SIGKILL)
        self.m.go_on()
        run.finish()


class Told(TellingTest):
    def test_a_run_that_fails(self):
        def config(old, new):
            return lambda: self.m.config.write_text(self.m.config.read_text().replace(old, new))
        for name, keys, breaks, count, said in (
                ('no shares', {}, lambda: self.m.shares.unlink(), 1, r"share\.conf can't be read"),
                ('not wanted', {'mail_on_failure': 'False'}, lambda: self.m.shares.unlink(), 0,
                 r"share\.conf can't be read"),
                ('a wrong line', {}, config('mail_to', 'nonsense\nmail_to'), 1, 'malformed line'),
                ('no folder', {'report_dir': '/etc/hostname/x'}, lambda: None, 1, 'is no folder'),
                ('no section', {}, config('[weekly]', '[other]'), 0, 'section=weekly'),
                ('no script', {}, lambda: (self.m.vorn / 'vornreport/reportUI/build-template.sh')
                 .unlink(), 1, 'create template failed')):
            with self.subTest(name):
                self.m = self.new_machine()
                server = self.mailed(**keys)
                self.m.shell(f'{CTL} schedule weekly --report @daily')
                line = (self.m.cron / 'vornreport-weekly').read_text().split('@daily root ')[1]
                breaks()
                # As cron does; it mails what isn't empty.
                run = self.m.shell(f'exec env -i HOME=/root LOGNAME=root SHELL=/bin/sh PATH=/usr/bin:/bin'
                                   f' /bin/sh -c {shlex.quote(line)}')
                self.assertEqual((run.out, self.m.report_folders('weekly'), self.m.leftovers()),
                                 ('', [], []))
                self.assertRegex(run.err, f'vornreport: .*{said}(.*\n)+vornreport: the run of profile '
                                          'weekly failed; vornctl doctor')
                mails = server.mails()
                self.assertEqual(len(mails), count)
                for mail in mails:
                    self.assertRegex(mail['Subject'], '^Storage report weekly of .* failed, ')
                    for form in ('plain', 'html'):
                        text = mail.get_body((form,)).get_content()
                        self.assertRegex(text, f'{said}|{said.replace(chr(39), "&#39;")}')
                        self.assertIn('vornctl run ', text)

    def test_data_that_can_not_be_collected(self):
        server = self.mailed(report_list='')
        run = self.m.run('--data', 'weekly')
        self.assertIn('No report selected', run.err)
        self.assertEqual((self.status()[0]['status'], len(server.mails())), ('fail', 1))

    def test_a_run_that_was_killed(self):
        server = self.mailed()
        self.m.profile('silent', report_list='share_list')
        cut = f'The run of {time.strftime("%Y-%m-%d")} .* did not finish'
        for profile in ('weekly', 'silent'):
            self.kill(profile)
            self.assertRegex(self.status(profile)[1], rf'{profile}: the run of [-\d: ]+ didn.t finish')
            first, second = self.m.run('--report', profile), self.m.run('--report', profile)
            self.assertEqual((first.log_lines, second.err, self.m.status(profile)), ([], '', 'success'))
            self.assertEqual('did not finish' in first.err, profile == 'silent')
        texts = [mail.get_body(('plain',)).get_content() for mail in server.mails()]
        self.assertEqual([bool(re.search(cut, text)) for text in texts], [True, False])

    def test_a_run_that_never_began(self):
        now = int(time.time())
        server = self.mailed()
        cron = self.m.cron / 'vornreport-weekly'
        # The times, when the last run began, since when the file is there, and whether that is late.
        for times, begun, there, late in (
                ('0 4 * * *', 9, 99, True), ('0 4 * * *', .5, 99, False), ('0 4 * * *', 0, 9, True),
                ('0 4 * * *', 0, .5, False), ('0 4 * * *', 9, .5, False), ('@hourly', .2, 99, True),
                ('@hourly', .03, 99, False), ('@weekly', 12, 99, True), ('@reboot', 9, 99, False)):
            with self.subTest(times, begun=begun, there=there):
                cron.write_text(f'{times} root /usr/vorn/bin/vornreport --report weekly\n')
                os.utime(cron, (now - there * DAY,) * 2)
                path = self.m.vorn / 'var/status/weekly'
                path.parent.mkdir(parents=True, exist_ok=True)
                path.write_text(f'success\nreport_started = {int(now - begun * DAY)}\n' if begun else
                                'success\n')
                entry, text = self.status()
                self.assertEqual((entry['overdue_since'] is not None,
                                  bool(re.search(r'weekly: no run (for \d+ days?|yet), though', text))),
                                 (late, late))
                self.m.run('--report', 'weekly')
                mail = server.mails()[-1].get_body(('plain',)).get_content()
                self.assertEqual('and did not begin then' in mail, late)
                self.assertIsNone(self.status()[0]['overdue_since'])

    def test_what_a_report_lacks(self):
        server = self.mailed(report_list='share_list', share_list='photos,gone')
        self.m.profile('silent', report_list='share_list', share_list='photos,gone')
        self.m.profile('lost', report_list='share_list', share_list='photos,gone',
                       mail_to='ann@localhost', smtp_url='smtp://127.0.0.1:1')
        lacks = 'share_list names gone, which is no share; correct the name'
        self.assertEqual(self.m.run('--report', 'weekly').err, '')
        self.assertIn(lacks, server.mails()[0].get_body(('plain',)).get_content())
        self.assertEqual(self.m.run('--report', 'silent').err, f'vornreport: profile silent: {lacks}\n')
        self.assertRegex(self.m.run('--report', 'lost').err, f'reached nobody(.*\n)+.*{lacks}')


class Metrics(TellingTest):
    def metrics(self, path):
        """The samples, name and labels to value; the tool finds nothing wrong with the file."""
        text = path.read_text()
        checked = subprocess.run(['promtool', 'check', 'metrics'], input=text, text=True,
                                 capture_output=True)
        self.assertEqual((checked.returncode, checked.stdout, checked.stderr), (0, '', ''))
        found = re.findall(r'^vornreport_(\w+)\{profile="weekly",?(.*)\} (\S+)$', text, re.MULTILINE)
        samples = {(name, labels): float(value) for name, labels, value in found}
        self.assertEqual(len(samples), len(re.findall('^[^#]', text, re.MULTILINE)), text)
        return samples

    def test_metrics(self):
        folder = self.m.base / 'metrics'
        folder.mkdir()
        path = folder / 'weekly.prom'
        self.m.share('{odd} = 1')
        self.m.share('gone').rmdir()
        self.m.profile('weekly', report_list='share_list,growth', metrics_file=path)
        made = []
        for size in (10, 500):
            make_files(self.m.base / 'shares/photos', {'a.jpg': size})
            self.m.run('--report', 'weekly')
            made.append(self.metrics(path))
        self.assertEqual(path.stat().st_mode & 0o777, 0o644)
        told = facts(self.m.report_folders('weekly')[-1])
        last = made[-1]
        for volume in told['volumes']:
            label = f'volume="{volume["path"]}"'
            self.assertEqual([last['volume_size_bytes', label], last['volume_used_bytes', label]],
                             [volume['size'], volume['used']])
        self.assertEqual((last['share_size_bytes', 'share="photos"'],
                          last['share_files', 'share="{odd} = 1"'],
                          last['share_growth_bytes', 'share="photos",since="last"'],
                          last['report_incidents', 'kind="share_missing"'],
                          last['report_incidents', 'kind="share_part"'],
                          last['last_run_success', '']), (500, 0, 490, 1, 0, 1))
        self.m.shares.rename(self.m.shares.with_name('away'))
        time.sleep(1.1)
        self.m.run('--report', 'weekly')
        failed = self.metrics(path)
        for name, expected in (('last_run_success', 0), ('share_files', last['share_files', 'share="photos"']),
                               ('last_success_timestamp_seconds',
                                last['last_success_timestamp_seconds', ''])):
            label = 'share="photos"' if name == 'share_files' else ''
            self.assertEqual(failed[name, label], expected, name)
        self.assertGreater(failed['last_run_timestamp_seconds', ''],
                           last['last_run_timestamp_seconds', ''])

    def test_paths_that_could_end_a_label(self):
        """Names of shares and users that could are refused before."""
        volumes = ['/tmp/say "hi"', '/tmp/a\\nb\\', '/tmp/\udcff', '/tmp/\udcfe', '/tmp/\\xff']
        for i, volume in enumerate(volumes):
            self.m.options += ['--tmpfs', 1 << 20, volume]
            self.m.share(f'share{i}', volume, inside=True)
        path = self.m.base / 'odd.prom'
        self.m.profile('weekly', report_list='share_list', metrics_file=path)
        self.m.run('--report', 'weekly')
        found = [label for name, label in self.metrics(path) if name == 'volume_level']
        self.assertLessEqual({r'volume="/tmp/say \"hi\""', r'volume="/tmp/a\\nb\\"',
                              r'volume="/tmp/\\xfe"', r'volume="/tmp/\\xff"'}, set(found))

    def test_forecast_levels_users_and_what_is_made_of_them(self):
        folder = self.m.reports / 'weekly/2026-01-02_03-04-05'
        folder.mkdir(parents=True)
        (folder / 'report.html').write_text('<!DOCTYPE html>\n</html>\n')
        (folder / 'report.json').write_text(json.dumps({
            'format': 1, 'started': 1767323045, 'finished': 1767323050, 'volumes': [
                {'path': '/a', 'level': 'critical', 'forecast': {
                    'state': 'growing', 'days': 12, 'days_low': 9, 'days_high': 20}},
                {'path': '/b"\\', 'level': 'warning', 'forecast': {'state': 'full'}},
                {'path': '/c', 'forecast': {'state': 'steady'}}],
            'incidents': [{'level': 'error', 'kind': 'share_missing', 'what': 'x', 'text': 'Gone.'}],
            'shares': [{'name': 'x', 'grown': {'month': {'since': 1, 'files': 1, 'bytes': 1}}}],
            'quotas': [{'volume': '/a', 'user': 'ann', 'used': 1, 'quota': 1, 'percent': 103.0}]}))
        (self.m.vorn / 'var/status/weekly').write_text('success\nsucceeded = 1767323050\n')
        self.m.shares.unlink()  # so the next run fails, and the report stays the newest
        for users in ('', 'true'):
            path = self.m.base / f'w{users}.prom'
            self.m.config.write_text(f'[weekly]\nreport_list = share_list\nmetrics_file = {path}\n'
                                     f'metrics_users = {users}\nreport_dir = {self.m.reports}\n')
            self.m.run('--report', 'weekly')
            found = self.metrics(path)
            self.assertEqual({label: value / DAY for (name, label), value in found.items()
                              if name == 'volume_full_in_seconds'},
                             {f'volume="{volume}",bound="{bound}"': days for volume, bound, days in (
                                 ('/a', 'low', 9), ('/a', 'mid', 12), ('/a', 'high', 20),
                                 *(('/b\\"\\\\', bound, 0) for bound in ('low', 'mid', 'high')))})
            self.assertEqual(found['volume_level', 'volume="/a"'], 2)
            self.assertEqual(found.get(('quota_used_ratio', 'volume="/a",user="ann"')),
                             1.03 if users else None)
        self.check_documents(path.read_text())

    def check_documents(self, metrics):
        """Each alert fires on these metrics, and each panel of the dashboard shows some of them: at
        the ninth day of a report that was made at its begin."""
        docs = self.m.stage / 'usr/share/doc/vornreport/prometheus'
        alerts = re.findall(r'- alert: (\w+)', (docs / 'alerts.yml').read_text())
        asked = re.findall(r'"(?:expr|definition)": (".*")', (docs / 'dashboard.json').read_text())
        queries = [re.sub(r'^label_values\((.*), (\w+)\)$', r'count by (\2) (\1)', re.sub(
            r'\$\w+', '.*', json.loads(query))) for query in asked]
        series = [{'series': f'{name}{{{labels},instance="server"}}',
                   'values': ('0' if 'timestamp' in name else value) + '+0x9'} for name, labels, value
                  in re.findall(r'^(vornreport_\w+)\{(.*)\} (\S+)$', metrics, re.MULTILINE)]
        expected = [(f'count(ALERTS{{alertname="{alert}"}}) > bool 0', '{}') for alert in alerts]
        expected += [(f'count({query}) > bool 0', '{}') for query in queries]
        rules = self.m.base / 'test.yml'
        rules.write_text(json.dumps({
            'rule_files': [str(docs / 'alerts.yml')], 'evaluation_interval': '1d', 'tests': [
                {'interval': '1d', 'input_series': series, 'promql_expr_test': [
                    {'expr': query, 'eval_time': '9d', 'exp_samples': [{'labels': labels, 'value': 1}]}
                    for query, labels in expected]}]}))
        self.assertGreater(len(alerts) + len(queries), 15)
        manual = (self.m.stage / 'usr/share/man/man8/vornreport.8').read_text()
        self.assertLessEqual(set(re.findall(r'# TYPE (\w+)', metrics)),
                             set(re.findall(r'vornreport_\w+', manual)))
        for words in (['check', 'rules', docs / 'alerts.yml'], ['test', 'rules', rules]):
            done = subprocess.run(['promtool', *words], stdout=subprocess.PIPE,
                                  stderr=subprocess.STDOUT, text=True)
            self.assertEqual(done.returncode, 0, done.stdout)

    @needs_root
    def test_folders_of_others(self):
        """A monitoring user's folder is written to, but nobody leads root out of it."""
        outside, own = self.m.base / 'outside', self.m.base / 'own'
        for folder in (outside, own, own / 'real'):
            folder.mkdir()
        (own / 'link').symlink_to(outside)
        (self.m.base / 'roots').symlink_to(own)
        (own / 'real/planted.prom').symlink_to(outside / 'victim.prom')
        os.chown(own, 65534, 65534)
        for place, wrong in (('own/real/a.prom', ''), ('own/real/planted.prom', ''),
                             ('roots/real/b.prom', ''), ('own/link/a.prom', 'is a link'),
                             ('own/gone/a.prom', 'missing'), ('own/real/a.txt', r'\.prom')):
            with self.subTest(place):
                path = self.m.base / place
                self.m.config.write_text('[global]\nreport_list = volume_usage\n[weekly]\n'
                                         f'report_list = share_list\nmetrics_file = {path}\n'
                                         f'report_dir = {self.m.reports}\n')
                run = self.m.run('--report', 'weekly')
                self.assertEqual(self.m.status('weekly'), 'success')
                self.assertRegex('\n'.join(run.log_lines), wrong or '^$')
                self.assertEqual(path.is_file() and not path.is_symlink(), not wrong)
                self.assertEqual(list(outside.iterdir()), [])

