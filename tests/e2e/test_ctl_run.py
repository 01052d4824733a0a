"""vornctl: runs, schedules, status, reports, and the doctor."""
import datetime
import json
import os
import pty
import re
import select
import signal
import time
from pathlib import Path

from harness import (CTL, LIMIT, PROGRAM, SCRIPTS, CtlTest, Run, make_files, needs_root,
                     wait_for)

ALONE = 'unshare', '--pid', '--fork', '--kill-child', '--mount-proc'  # sees its own processes only
WHOLE, CUT = '<!DOCTYPE html>\n</html>\n', '<!DOCTYPE html>\n'


class Feed(list):
    """Log lines that a log daemon would write to a file."""

    def append(self, line):
        with self.path.open('a') as file:
            file.write(f'Nov 21 06:00:00 host vornreport: {line}\n')


class WeeklyTest(CtlTest):
    def setUp(self):
        super().setUp()
        make_files(self.m.share('photos'), {'a.jpg': 10})
        self.m.profile('weekly', report_list='share_list,large_file')

    def stored(self, profile, reports):
        """Makes report folders, name to page, as runs would have."""
        for name, page in reports.items():
            folder = self.m.reports / profile / name
            (folder / 'csv').mkdir(parents=True)
            (folder / 'report.html').write_text(page)
        return self.m.reports / profile


class Running(WeeklyTest):
    def test_outcomes(self):
        self.m.profile('nowhere', report_list='share_list', report_dir='/dev/null/reports')
        self.m.profile('bare')
        self.stored('weekly', {'2099-01-01_00-00-00': WHOLE})  # of a clock that was wrong
        page = rf'{self.m.reports}/weekly/(?!2099)[-_\d]*/report\.html\n'
        for arguments, status, err, out in (
                (['weekly'], 0, '', page),
                (['weekly', '--data'], 0, '', ''),
                (['global', '--data'], 0, '', ''),
                (['global'], 2, '"global" stands for the whole server', ''),
                (['nobody'], 1, 'profile "nobody" is not in ', ''),
                (['bare'], 1, 'profile bare selects no report', ''),
                (['nowhere'], 1, 'report folder /dev/null/reports/nowhere can.t be used: ', '')):
            with self.subTest(arguments):
                self.check(['run', *arguments], status, err, out)
                self.assertEqual(self.m.leftovers(), [])
        self.assertRegex(self.ctl('status', 'global').out, 'global +success ')
        self.m.shares.unlink()
        (self.m.vorn / 'vornreport/sql/vornreport.sql').unlink()
        (self.m.vorn / 'etc/vornreport.db').unlink()
        where = 'see vornctl log weekly, and vornctl doctor'
        self.check(['run', 'weekly'], 1, rf'(.*\n)+vornctl: the run of .* failed; {where}')
        self.check(['run', 'global', '--data'], 1, r'(.*\n)+vornctl: collecting data .* failed')

    def test_a_report_that_lacks_something(self):
        with self.m.shares.open('a') as file:
            file.write(f'[gone]\npath = {self.m.base}/gone\n[same]\npath = {self.m.base}/shares/photos\n')
        page = rf'{self.m.reports}/weekly/[-_\d]*/report\.html\n'
        self.check(['run', 'weekly'], 3, r'shares photos and same hold the same files.*\n'
                   r'vornctl: share gone is missing ', page)
        entry, = json.loads(self.ctl('status', 'weekly', '--json').out)
        self.assertEqual((entry['status'], entry['complete'],
                          {each['kind']: each['what'] for each in entry['incidents']}),
                         ('success', False, {'share_missing': 'gone',
                                             'share_overlap': 'photos, same'}))
        self.assertIn('\nincidents = 2\n', (self.m.vorn / 'var/status/weekly').read_text())
        self.assertIn('share gone is missing', self.ctl('doctor').out)

    def test_all_profiles_and_json(self):
        self.m.profile('bare')
        self.m.profile('more', report_list='share_list')
        page = rf'{self.m.reports}/%s/[-_\d]*/report\.html\n'
        self.check(['run', '--all'], 1, 'profile bare selects no report',
                   page % 'weekly' + page % 'more')
        run = self.ctl('run', '--all', '--json')
        told = json.loads(run.out)
        self.assertEqual([(each['profile'], each['status'], each['report'] is not None)
                          for each in told],
                         [('weekly', 'success', True), ('bare', 'fail', False),
                          ('more', 'success', True)])
        self.assertEqual(told[0]['report'],
                         json.loads(self.ctl('status', 'weekly', '--json').out)[0]['last_report'])
        self.assertIn('selects no report', told[1]['error'])
        data = json.loads(self.ctl('run', 'more', '--data', '--json').out)
        self.assertEqual((data['kind'], data['report']), ('data', None))
        for wrong in (['run'], ['run', 'weekly', '--all']):
            self.check(wrong, 2, 'name one profile, or give --all')

    def test_log(self):
        self.check(['log', 'weekly'], 1, 'profile weekly has not run yet')
        logs = self.m.base / 'logs'
        logs.mkdir()
        self.m.options += ['--bind', logs, '/var/log', '--tmpfs', '4096', '/run']
        self.ctl('run', 'weekly')
        now = datetime.datetime.now().astimezone()
        hour = datetime.timedelta(hours=1)
        for stamp in (lambda time: time.strftime('%b %d %H:%M:%S'), datetime.datetime.isoformat):
            with self.subTest(stamp(now)):
                (logs / 'syslog').write_text(''.join(
                    f'{stamp(time)} host {what}\n' for time, what in (
                        (now - hour, 'vornreport: earlier'), (now, 'vornreport: of \x1b it'),
                        (now, 'cron: other'), (now + hour, 'vornreport: later'))))
                self.check(['log', 'weekly'], out=r'.* vornreport: of \\x1b it\n')
        (logs / 'syslog').write_text('')
        self.check(['log', 'weekly'], err='the run of .* has said nothing')

    def test_a_mail_that_nobody_got(self):
        self.m.profile('mailed', report_list='share_list', mail_to='a@b.example',
                       smtp_url='smtp://127.0.0.1:1')
        unsent = 'the mail of the last report reached nobody; '
        self.check(['run', 'mailed'], 3, unsent, rf'{self.m.reports}/mailed/.*\n')
        self.assertIn('\nmail = failed\n', (self.m.vorn / 'var/status/mailed').read_text())
        self.assertRegex(self.ctl('status', 'mailed').out, unsent)

    def test_failure_tells_what_the_log_says(self):
        logs = self.m.base / 'logs'
        logs.mkdir()
        (logs / 'syslog').write_text('Nov 20 host vornreport: of yesterday\n')
        self.m.options += ['--bind', logs, '/var/log']
        self.m.shares.unlink()
        log = self.m.new_log()
        log.lines = Feed()
        log.lines.path = logs / 'syslog'
        run = self.ctl('run', 'weekly', log=log)
        self.assertIn('share.conf can\'t be read', run.err)
        self.assertEqual((run.status, 'yesterday' in run.err), (1, False))

    def test_progress(self):
        master, slave = pty.openpty()
        self.addCleanup(os.close, master)
        shown = ''
        for call, phase in (('lang', 'weekly: starting'),
                            ('body 2', 'weekly: putting the page together')):
            self.m.stop_at(call)
            run = Run(self.m, ['env', 'TERM=xterm', CTL, 'run', 'weekly'], None, stderr=slave)
            self.m.stopped_pid()
            end = time.monotonic() + LIMIT
            while phase not in shown and time.monotonic() < end:
                if select.select([master], [], [], 1)[0]:
                    shown += os.read(master, 4096).decode()
            self.assertIn(phase, shown)
            self.m.go_on()
            self.assertEqual(run.finish().status, 0)
        while select.select([master], [], [], 0.1)[0]:
            os.read(master, 4096)
        Run(self.m, ['env', 'TERM=dumb', CTL, 'run', 'weekly'], None, stderr=slave).finish()
        self.assertEqual(select.select([master], [], [], 0.5)[0], [])
        os.close(slave)

    def test_one_run_at_a_time(self):
        self.m.stop_at('lang')
        run = self.m.start('--report', 'weekly')
        self.m.stopped_pid()
        said = rf'profile weekly is running already \(process {run.pid()}\)'
        for option in ([], ['--data']):
            self.check(['run', 'weekly', *option], 1, said)
        self.assertIn('running', self.ctl('status').out)
        self.m.go_on()
        self.assertSucceeded(run.finish(), 'weekly')

    def test_signals_end_the_run_and_clear_up(self):
        for number in (signal.SIGINT, signal.SIGTERM, signal.SIGHUP):
            with self.subTest(number):
                self.m.stop_at('body 2')
                run = Run(self.m, [CTL, 'run', 'weekly'], None)
                self.m.stopped_pid()
                os.kill(run.pid('vornctl'), number)
                run.finish()
                self.m.go_on()
                self.assertEqual((run.status, run.out), (1, ''))
                self.assertRegex(run.err, '^vornctl: the run of profile weekly was ended.*\n$')
                self.assertEqual((self.m.leftovers(), self.m.report_folders('weekly')), ([], []))
                self.assertEqual(self.m.status('weekly'), 'fail')


class Schedules(WeeklyTest):
    HEAD = '# Written by vornctl; change it with vornctl schedule.\n'

    def files(self):
        return {path.name: path.read_text() for path in self.m.cron.iterdir()}

    def test_schedule(self):
        def job(times, option, profile):
            return (f'{times} root [ ! -x {PROGRAM} ] || {PROGRAM} {option} {profile} '
                    '>/dev/null\n')
        self.m.profile('a.b', report_list='volume_usage', schedule_collect_id='has.dots')
        self.m.profile('own', report_list='volume_usage', schedule_collect_id='job1')
        self.m.profile('twin', report_list='volume_usage', schedule_collect_id='weekly')
        report = job('0 4 * * 1', '--report', 'weekly')
        data = job('*/5 0-6/2 1,15 1-3 0,2-4', '--data', 'weekly')
        mine = '@daily root /usr/vorn/bin/vornreport --report gone\n'
        other = {'vornreport-job1': '0 0 * * * root backup\n', 'mine': mine, 'vornreport-gone': mine}
        for name, text in other.items():
            (self.m.cron / name).write_text(text)
        weekly = 'vornreport-weekly'
        for arguments, status, changed, err in (
                (['weekly', '--report', ' 0  4 * * MON'], 0, {weekly: report}, ''),
                (['weekly', '--report', '0 4 * * 1'], 1, {weekly: report}, 'profile twin has '),
                (['twin', '--clean'], 1, {weekly: report}, 'holds other jobs '),
                (['profile', 'set', 'twin', 'schedule_collect_id', ''], 0, {weekly: report}, ''),
                (['weekly', '--report', '0 4 * * 1'], 0, {weekly: report}, ''),
                (['weekly', '--data', '*/5 0-6/2 1,15 jan-mar sun,tue-thu'], 0,
                 {weekly: report + data}, ''),
                (['weekly', '--data', '@daily'], 0,
                 {weekly: report + job('@daily', '--data', 'weekly')}, ''),
                (['a.b', '--data', '@hourly'], 0,
                 {'vornreport-a-b-108bf50c': job('@hourly', '--data', 'a.b')}, ''),
                (['a.b', '--clean'], 0, {'vornreport-a-b-108bf50c': None}, ''),
                (['own', '--report', '@daily'], 1, {}, 'vornreport-job1 holds other jobs '),
                (['gone', '--clean'], 0, {'vornreport-gone': None}, r'mine still runs .*its line'),
                (['weekly', '--clean'], 0, {weekly: None}, ''),
                (['weekly', '--clean'], 0, {}, ''),
                (['weekly'], 0, {}, ''),
                (['global', '--report', '@daily'], 2, {}, '"global" stands for '),
                (['nobody', '--clean'], 1, {}, 'profile "nobody" is not in '),
                *((['weekly', '--data', times], 2, {}, wrong) for times, wrong in (
                    ('60 * * * *', 'minute'), ('* 24 * * *', 'hour'),
                    ('* * 0 * *', 'day of the month'), ('* * * foo *', 'month'),
                    ('* * * * 8', 'day of the week'), ('5/2 * * * *', 'minute'),
                    ('*/0 * * * *', 'minute'), ('1,,2 * * * *', 'minute'), ('* 5-1 * * *', 'hour'),
                    ('* * 30 2 *', 'never comes'), ('* * * *', 'has 4 fields'),
                    ('@sometimes', 'no time'), ('* * * * *\nx', 'has 6 fields|day of the week')))):
            with self.subTest(arguments):
                command = arguments if 'profile' in arguments else ['schedule', *arguments]
                self.check(command, status, err, r'(.*\n)*')
                for name, text in changed.items():
                    other[name] = text and self.HEAD + text
                other = {name: text for name, text in other.items() if text}
                self.assertEqual(self.files(), other)
                for path in self.m.cron.glob('vornreport-[aw]*'):
                    self.assertEqual(path.stat().st_mode & 0o7777, 0o644)
                keys = re.findall(r'schedule_collect_id = (\S+)', self.m.config.read_text())
                self.assertLessEqual({name[11:] for name in other} - {'', 'gone'}, set(keys))
        self.ctl('schedule', 'weekly', '--data', '@daily')
        (self.m.cron / 'mine').write_text(mine.replace('gone', 'weekly'))
        clean = self.m.run('--clean', 'weekly')
        self.assertNotIn(weekly, self.files())
        self.assertEqual(clean.log_lines, ['profile "weekly" is still run by /etc/cron.d/mine; run '
                                           'vornctl schedule weekly --clean'])
        (self.m.cron / 'mine').unlink()
        # Two at once lose nothing of each other's.
        one = f'{CTL} schedule weekly'
        run = Run(self.m, ['sh', '-c', f'for i in 1 2 3 4 5 6 7 8; do {one} --clean; '
                           f'{one} --report @daily & {one} --data @daily & wait; '
                           f'grep -c @daily /etc/cron.d/{weekly} >&2; done'], None).finish()
        self.assertEqual(run.err, '2\n' * 8)

    def test_cron_runs_it(self):
        """Debian's cron, in a process namespace and with files of its own."""
        for name in ('run', 'spool'):
            (self.m.base / name).mkdir()
        (self.m.base / 'crontab').write_text('')
        self.m.options += ['--bind', self.m.base / 'run', '/run', '--bind', self.m.base / 'spool',
                           '/var/spool/cron', '--bind', self.m.base / 'crontab', '/etc/crontab']
        self.m.profile('hourly', report_list='volume_usage')
        self.check(['schedule', 'hourly', '--data', '* * * * *'], out='--data hourly: .*\n')
        cron = Run(self.m, [*ALONE, 'cron', '-f'], None)
        self.addCleanup(cron.finish)
        self.addCleanup(cron.process.terminate)
        end = time.monotonic() + 130
        while not (self.m.vorn / 'var/status/hourly').exists() and time.monotonic() < end:
            time.sleep(0.5)
        wait_for(lambda: self.m.status('hourly') == 'success', 'the end of the run')
        self.assertTrue(self.m.history("select * from VolumeUsage where profile = 'hourly'"))


class Status(WeeklyTest):
    def test_status(self):
        folder = self.stored('weekly', {'2026-01-02_03-04-05': WHOLE, '2026-01-03_03-04-05': CUT})
        (folder / '2026-01-02_03-04-05/report.json').write_text(json.dumps({
            'format': 1, 'complete': False, 'volumes': [
                {'path': '/srv/a', 'size': 100, 'percent': 90.0,
                 'forecast': {'state': 'growing', 'days': 12, 'days_low': 9, 'days_high': 20}},
                {'path': '/', 'size': 100, 'percent': 95.0, 'forecast': {'state': 'steady'}}],
            'incidents': [{'level': 'error', 'kind': 'share_missing', 'what': 'x', 'text': 'Gone.'}],
            'attention': [
                {'level': 'critical', 'code': 'volume_fills', 'section': 'volume_usage', 'values': {
                    'volume': '/srv/a', 'days': 12, 'days_low': 9, 'days_high': 20}},
                {'level': 'ok', 'code': 'share_largest', 'section': 'share_list',
                 'values': {'share': 'x', 'bytes': 1}}]}))
        (self.m.vorn / 'var/status').mkdir(parents=True, exist_ok=True)
        self.m.profile('far', report_list='share_list', report_dir='relative')
        states = {'weekly': ('success', 'success'), 'far': ('fail', 'fail'),
                  'cut': ('collect_data', 'ended early'), 'new': (None, 'never ran')}
        for name, (word, _) in states.items():
            if word:
                (self.m.vorn / 'var/status' / name).write_text(word + '\n')
            if name in ('cut', 'new'):
                self.m.profile(name, report_list='share_list')
        run = self.ctl('status', '--json')
        found = {entry['profile']: entry for entry in json.loads(run.out)}
        self.assertEqual({name: entry['status'] for name, entry in found.items()},
                         {name: shown for name, (_, shown) in states.items()})
        self.assertIn('report_dir "relative" is not absolute', run.err)
        weekly = found['weekly']
        self.assertEqual(weekly['last_report']['path'], f'{folder}/2026-01-02_03-04-05/report.html')
        self.assertEqual([weekly['volume']['path'], weekly['volume']['forecast']['days'],
                          weekly['complete'], weekly['incidents'][0]['what'],
                          weekly['attention'][0]['text']],
                         ['/srv/a', 12, False, 'x', '/srv/a: full in about 12 days (9 to 20)'])
        self.assertEqual({found['new'][key] for key in ('last_report', 'volume', 'complete',
                                                        'incidents', 'attention')}, {None})
        self.assertRegex(self.ctl('status', 'weekly').out,
                         r'weekly +success +2026-01-02 03:04 +\S+ KiB +- +/srv/a, 90% +full in about '
                         r'12 days \(9 to 20\)\nweekly: Share x is missing.*\n'
                         r'weekly: /srv/a: full in about 12 days \(9 to 20\)\n$')
        listed, = (entry for entry in json.loads(self.ctl('reports', 'weekly', '--json').out)
                   if entry['level'])
        self.assertEqual((listed['level'], len(listed['incidents'])), ('critical', 1))
        self.assertEqual(listed, weekly['last_report'])
        self.assertRegex(self.ctl('reports', 'weekly').out, r'yes, lacking 1 +critical +/')

    def test_next_run(self):
        self.ctl('schedule', 'weekly', '--report', '0 4 * * *')
        now = datetime.datetime.now()
        at_four = now.replace(hour=4, minute=0, second=0, microsecond=0)
        expected = at_four + datetime.timedelta(days=int(at_four <= now))
        entry = json.loads(self.ctl('status', 'weekly', '--json').out)[0]
        self.assertEqual(entry['next_run']['time'][:19], expected.isoformat())


class ListOfReports(WeeklyTest):
    def test_it_follows_the_reports(self):
        folder = self.m.reports / 'weekly'
        evil = '</script><script>document.title=1</script>'
        made = []

        def run(log=()):
            time.sleep(1.1)  # reports are called by the second
            done = self.m.run('--report', 'weekly')
            self.assertEqual((done.status, [re.sub(r'.*weekly/(\S+) .*', r'\1', line) for line in done.log_lines]),
                             (0, list(log)))
            made[:] = [path.name for path in self.m.report_folders('weekly')]

        def facts(name, change):
            file = folder / name / 'report.json'
            file.write_text(change(json.loads(file.read_text())))

        def hostile(json_):
            volume = json_['volumes'][0]
            return json.dumps(json_ | {'host': evil, 'started': 2 ** 62, 'attention': [
                {'level': 'critical'}], 'volumes': [volume | {'path': evil, 'used': 2 ** 64 - 1},
                                                    *[volume | {'path': f'/{i}'} for i in range(200)]]})

        def remove(name):
            self.assertEqual(self.ctl('reports', 'weekly', 'remove', name).status, 0)
            made.remove(name)

        def foreign():
            (folder / 'latest').unlink()
            (folder / 'latest').mkdir()
            (folder / 'index.html').write_text('mine')

        def own_again():
            (folder / 'latest').rmdir()
            (folder / 'latest').symlink_to(self.m.base)
            (folder / 'index.html').unlink()
            (folder / 'index.html').symlink_to(folder / 'mine')
            (folder / 'mine').write_text('mine')

        def moved_away():
            (folder / 'latest').unlink()
            (folder / 'index.html').unlink()

        ok, none, worst = ('ok', True), (None, False), ('critical', True)
        for step, act, figures in (
                ('one run', run, [ok]), ('another', run, [ok, ok]),
                ('none to read', lambda: (facts(made[0], lambda _: '{'), run()), [none, ok, ok]),
                ('a removed one', lambda: remove(made[1]), [none, ok]),
                ('hostile facts', lambda: (facts(made[1], hostile), run()), [worst, none, ok]),
                ('as many as are kept', lambda: (self.ctl(
                    'profile', 'set', 'weekly', 'keep_reports', '2'), run()), [ok, ok]),
                ("others' file and folder", lambda: (foreign(), run(['latest', 'index.html'])), None),
                ("others' links", lambda: (own_again(), run(['latest', 'index.html'])), None),
                ('nothing again', lambda: (moved_away(), run()), [ok, ok]),
                ('the newest removed', lambda: remove(made[-1]), [ok]),
                ('no report left', lambda: remove(made[0]), [])):
            with self.subTest(step):
                act()
                if figures is None:
                    self.assertEqual((folder / 'index.html').read_text() if step.endswith('folder') else
                                     (folder / 'mine').read_text(), 'mine')
                    self.assertNotIn(os.path.basename(os.path.realpath(folder / 'latest')), made)
                    continue
                text = (folder / 'index.html').read_text()
                self.assertNotIn(evil, text)
                data, = re.findall(r'<script type="application/json" id="data">(.*)</script>\n', text)
                data = json.loads(data)
                self.assertEqual(sorted(row['name'] for row in data['reports']), made)
                self.assertEqual([(row.get('level'), 'used' in row) for row in data['reports']], figures)
                # By a clock that is far ahead no report is the newest.
                newest = [os.readlink(folder / 'latest')] if made else []
                self.assertEqual((newest, os.path.lexists(folder / 'latest')), (made[-1:], bool(made)))
                if ok in figures:
                    readable = [row['made'] for row in data['reports'] if 'used' in row]
                    self.assertEqual([made_at for made_at, used, size in data['volumes'][0]['samples']],
                                     [made_at for made_at in readable if made_at < 2 ** 62])
                self.assertEqual([path.name for path in folder.iterdir() if path.name.startswith('.')], [])
        self.assertEqual((folder / 'mine').read_text(), 'mine')


class Reports(WeeklyTest):
    def test_reports(self):
        recent = datetime.datetime.now() - datetime.timedelta(days=3)
        names = ['2020-01-02_03-04-05', '2020-01-02_03-04-05-2',
                 recent.strftime('%Y-%m-%d_%H-%M-%S')]
        old, second, new = names
        spared = {'2020-02-02_00-00-00', 'template', 'mine', '2020-03-03_00-00-00',
                  '.2020-01-01_00-00-00.partial'}
        for arguments, status, removed in (
                (['remove', '--older-than', '90d', '--dry-run'], 0, []),
                (['remove', '--older-than', '90d'], 0, [old, second]),
                (['remove', '--older-than', '2d'], 0, names),
                (['keep', '2'], 0, [old]), (['keep', '2', '--dry-run'], 0, []),
                (['keep', '9'], 0, []), (['keep', '0'], 2, []), (['keep'], 2, []),
                (['remove'], 2, []), (['remove', old, '--older-than', '2d'], 2, []),
                (['remove', new], 0, [new]), (['remove', new[:10], '--dry-run'], 0, []),
                (['remove', old], 0, [old]), (['remove', '2020-01'], 1, []),
                (['remove', '2020-02-02'], 1, []), (['remove', '../x'], 1, []),
                (['remove', '--older-than', '0d'], 2, []),
                (['remove', '--older-than', '9'], 2, []), (['purge'], 2, [])):
            with self.subTest(arguments):
                self.m = self.new_machine()
                self.m.profile('weekly', report_list='share_list')
                folder = self.stored('weekly', dict.fromkeys(names, WHOLE) | {
                    '2020-02-02_00-00-00': CUT})
                outside = self.m.base / '2020-03-03_00-00-00'
                outside.mkdir()
                (outside / 'report.html').write_text(WHOLE)
                (folder / outside.name).symlink_to(outside)
                for name in ('template', 'mine', '.2020-01-01_00-00-00.partial'):
                    (folder / name).mkdir()
                    (folder / name / 'report.html').write_text(WHOLE)
                self.assertEqual(self.ctl('reports', 'weekly', *arguments).status, status)
                listed = {'index.html', 'latest'} if removed and 'dry' not in arguments[-1] else set()
                if removed == names:
                    listed.discard('latest')
                self.assertEqual({path.name for path in folder.iterdir()},
                                 spared | listed | set(names) - set(removed))
                self.assertTrue((outside / 'report.html').exists())

    def test_list_and_open(self):
        folder = self.stored('weekly', {
            '2020-01-02_03-04-05': WHOLE, '2020-01-03_03-04-05': WHOLE, '2021-01-01_00-00-00': CUT})
        shown = json.loads(self.ctl('reports', 'weekly', '--json').out)
        self.assertEqual([(entry['name'], entry['whole']) for entry in shown],
                         [('2020-01-02_03-04-05', True), ('2020-01-03_03-04-05', True),
                          ('2021-01-01_00-00-00', False)])
        for date, name in (('', '2020-01-03_03-04-05'), ('2020-01-02', '2020-01-02_03-04-05')):
            page = f'{folder}/{name}/report.html'
            self.check(['reports', 'weekly', 'open', *date.split()], out=f'{page}\nfile://{page}\n')
        self.check(['reports', 'weekly', 'open', '2021'], 1, 'profile weekly has no complete ')


    def test_compare(self):
        def facts(used, **more):
            return {'format': 1, 'volumes': [{'path': '/srv', 'used': used}]} | more

        def share(name, size, files, whole=True):
            return {'name': name, 'bytes': size, 'files': files, 'whole': whole}
        gib = 1 << 30
        folder = self.stored('weekly', dict.fromkeys(
            ('2026-01-01_00-00-00', '2026-01-02_00-00-00', '2026-01-03_00-00-00'), WHOLE))
        for day, content in ((1, facts(gib, shares=[share('a', gib, 3), share('old', 5, 1)], owners=[
                                 {'name': 'u\x1b', 'bytes': 1 << 63, 'files': 1}])),
                             (2, facts(3 * gib, shares=[share('a', 2 * gib, 1),
                                                        share('new', 7, 1, False)], owners=[
                                 {'name': 'u\x1b', 'bytes': 0, 'files': 1}],
                                 incidents=[{'level': 'error', 'kind': 'share_missing', 'what': 'old',
                                             'text': 'x'}]))):
            (folder / f'2026-01-0{day}_00-00-00/report.json').write_text(json.dumps(content))
        for dates in (('2026-01-01', '2026-01-02'), ('2026-01-02', '2026-01-01')):
            shown = self.ctl('reports', 'weekly', 'compare', *dates)
            self.assertRegex(shown.err, 'report 2026-01-02_00-00-00: Share old is missing')
            rows = [re.split('  +', line) for line in shown.out.splitlines()[2:]]
            self.assertEqual(rows, [
                ['volume', '/srv', '1 GiB', '3 GiB', '+2 GiB', '-'],
                ['share', 'a', '1 GiB', '2 GiB', '+1 GiB', '-2'],
                ['share', 'new', '-', '7 B', '+7 B', '+1', 'new'],
                ['share', 'old', '5 B', '-', '-5 B', '-1', 'gone'],
                ['owner', r'u\x1b', '8 EiB', '0 B', '-8 EiB', '+0']])
        found = json.loads(self.ctl('reports', 'weekly', 'compare', *dates, '--json').out)
        self.assertEqual((found['from']['name'], found['types'], found['shares'][1]),
                         ('2026-01-01_00-00-00', None,
                          {'name': 'new', 'bytes': {'before': None, 'after': 7, 'change': 7},
                           'files': {'before': None, 'after': 1}, 'whole': False}))
        for dates, message in ((['2026-01-01', '2026-01-01'], 'both dates name'),
                               (['2025'], 'has no complete report of 2025'),
                               (['2026-01-01'], '2026-01-03_00-00-00 has no report.json')):
            self.check(['reports', 'weekly', 'compare', *dates], 1, message)


class EveryCommand(WeeklyTest):
    def test_help_and_version(self):
        self.check(['--version'], out=r'vornctl \d+\.\d+\.\d+\n')
        help_of = {}
        for words in ('', 'share', 'share set', 'profile copy', 'run', 'reports', 'reports compare'):
            help_of[words] = self.ctl('help', *words.split()).out
            of_command = words.split()[:1] if words == 'reports compare' else words.split()
            self.assertEqual(self.ctl(*of_command, '--help').out, help_of[' '.join(of_command)])
        self.assertIn('reports PROFILE compare [OPTIONS] DATE [DATE2]', help_of['reports compare'])
        self.assertEqual(self.ctl('reports', 'weekly', 'compare', '--help').out,
                         help_of['reports compare'])
        # A profile may be called as an action is.
        self.m.profile('remove', report_list='share_list')
        self.check(['reports', 'remove'], err='there are no reports in .*/remove; ')
        self.check(['reports', 'weekly', 'purge'], 2, '"purge" is no command')

    @needs_root
    def test_another_user_is_told_to_be_root(self):
        for folder in (self.m.base, self.m.stage, self.m.stage / 'usr'):
            folder.chmod(0o755)

        def usages(*words):
            """The usage of each command below this one, out of the help."""
            text = self.ctl('help', *words).out
            commands = re.findall(r'^  ([a-z]\S*)  ', text.partition('Subcommands:')[2], re.M)
            return [usage for command in commands for usage in usages(*words, command)] or [text]
        found = usages()
        self.assertGreater(len(found), 25)
        as_nobody = 'setpriv', '--reuid=65534', '--regid=65534', '--clear-groups', CTL
        for usage in found:
            line, = re.findall('Usage: vornctl (.*)', usage)
            needed = re.findall(r'^  (--[a-z-]+) .*REQUIRED', usage, re.M)
            words = [re.sub('[A-Z]+', '1', word) for word in re.sub(r'\[.*?\]', '', line).split()]
            words += [word for option in needed for word in (option, '1')]
            with self.subTest(words):
                run = Run(self.m, [*as_nobody, *words], None).finish()
                self.assertEqual((run.status, run.out), (1, ''), run.err)
                self.assertRegex(run.err, '^vornctl: .*; run this as root\n$')
        os.chown(self.m.vorn / 'etc', 65534, -1)  # staged by this user, to try it
        run = Run(self.m, [*as_nobody, 'profile', 'list'], None).finish()
        self.assertEqual((run.status, run.err), (0, ''))


class Doctor(WeeklyTest):
    def test_each_fault_is_found(self):
        def place(path):
            return self.m.vorn / path

        def configure(**keys):
            return lambda: self.m.profile('more', **{'report_list': 'share_list'} | keys)

        def write(path, text):
            return lambda: place(path).write_text(text)

        def append(path, text):
            return lambda: path().write_text(path().read_text() + text)

        def leftover():
            (self.m.reports / 'weekly/.2026-01-01_00-00-00.partial').mkdir(parents=True)

        def killed():
            (self.m.vorn / 'var/status').mkdir(parents=True, exist_ok=True)
            (self.m.vorn / 'var/status/weekly').write_text('collect_data\n')

        def bind(text, target):
            def apply():
                (self.m.base / 'bound').write_text(text)
                if os.path.exists(target):
                    self.m.options += ['--bind', self.m.base / 'bound', target]
            return apply

        def schedule(text, mode=0o644):
            def apply():
                (self.m.cron / 'mine').write_text(text)
                (self.m.cron / 'mine').chmod(mode)
            return apply
        config, shares = (lambda: self.m.config), (lambda: self.m.shares)
        script, schema = 'vornreport/reportUI/build-template.sh', 'vornreport/sql/vornreport.sql'
        line = f'* * * * * root {PROGRAM} --data weekly\n'
        for word, expected, breaks in (
                ('', '', lambda: None),
                ('', '', configure(report_list='large_file_db share_list', volume_history='TRUE')),
                ('error', 'program: .*can\'t be run', lambda: place('bin/vornreport').chmod(0o644)),
                ('error', 'template: ', lambda: place(script).unlink()),
                ('error', 'template: ', write(script, '#!/bin/sh\nexit 3\n')),
                ('error', 'schema: .*can\'t be read', lambda: place(schema).unlink()),
                ('error', 'schema: .*is broken', write(schema, 'create nothing')),
                ('error', 'history: .*is broken', write('etc/vornreport.db', 'x' * 5000)),
                ('error', 'rights of /usr/vorn/etc: everyone', lambda: place('etc').chmod(0o777)),
                ('error', 'rights of /usr/vorn/bin: .*root', lambda: os.chown(place('bin'), 1, 0)),
                ('error', r'vornreport\.conf: line \d+: ', append(config, 'a line\n')),
                ('error', r'conf: line \d+: .*stands above', append(config, '[weekly]\n')),
                ('error', 'profile a/b: ', append(config, '[a/b]\nreport_list = share_list\n')),
                ('error', 'profile more: .*large_file', configure(report_list='larg_file')),
                ('error', 'profile more: it selects no report', configure(report_list='')),
                ('error', 'open is writable by others, .*; run chmod go-w', lambda: [
                    place('open').mkdir(), place('open').chmod(0o770),
                    configure(report_dir='/usr/vorn/open/r')()]),
                ('error', 'profile more: share_list: ', configure(share_list='photos,fotos')),
                ('warning', 'profile more: the key languge .*"language"', configure(languge='de')),
                ('error', 'share 007: ', append(shares, '[007]\npath = /\n')),
                ('error', 'share none: .*has no path', append(shares, '[none]\n')),
                ('error', 'share gone: .*found', append(shares, '[gone]\npath = /nowhere\n')),
                ('error', 'share sys: .*not walked', append(shares, '[sys]\npath = /proc\n')),
                ('error', 'mail server smtp://127.0.0.1:1: ',
                 configure(mail_to='a@example.com', smtp_url='smtp://127.0.0.1:1')),
                ('error', 'cron: it does not run', schedule(line)),
                ('error', 'schedule .*mine: .*the hour', schedule(line.replace('* *', '* 25', 1))),
                ('error', 'schedule .*mine: it can be written', schedule(line, 0o666)),
                ('warning', 'mine: profile gone .*; remove its line from .*/mine',
                 schedule(line.replace('weekly', 'gone'))),
                ('error', 'template: .*index.js', lambda: (
                    self.m.stage / SCRIPTS / 'template/index.js').unlink()),
                ('warning', 'quotas: no volume has any, .*report_list share_list$',
                 configure(report_list='quota_usage,share_list')),
                ('error', 'profile more: its metrics_file is that of again',
                 lambda: [self.m.profile(name, report_list='share_list',
                                         metrics_file='/tmp/x.prom') for name in ('again', 'more')]),
                ('warning', 'schedule of more: .*missing', configure(schedule_collect_id='job9')),
                ('warning', 'schedule of more: nothing makes .*schedule more --report', configure()),
                ('error', 'profile weekly: .*correct the lines .* that are told above',
                 append(config, 'language = xx\n[weekly]\n')),
                ('warning', 'share in: shares photos and in hold',
                 append(shares, '[in]\npath = /var/tmp\n')),
                ('warning', 'last run of weekly: ended early', killed),
                ('warning', 'leftovers of weekly: ', leftover),
                ('warning', 'time zone: ', bind('no zone', os.path.realpath('/etc/localtime'))),
                ('error', 'quota tool: ',
                 lambda: (configure(report_list='quota_usage')(),
                          bind('', os.path.realpath('/sbin/repquota'))()))):
            with self.subTest(expected):
                self.m = self.new_machine()
                self.m.share('photos')
                self.m.profile('weekly', report_list='share_list')
                breaks()
                # Alone: this machine's own cron isn't the one that the doctor looks for.
                run = Run(self.m, [*ALONE, CTL, 'doctor', '--json'], None).finish()
                found = json.loads(run.out)
                bad = [entry for entry in found if entry['level'] != 'ok']
                errors = [entry for entry in bad if entry['level'] == 'error']
                self.assertEqual((run.status, run.err), (int(bool(errors)), ''), run.out)
                self.assertTrue(all(entry['remedy'] for entry in bad), bad)
                if not expected:
                    self.assertEqual(errors, [])
                    continue
                self.assertTrue([entry for entry in bad if entry['level'] == word and re.search(
                    expected, f"{entry['subject']}: {entry['text']}; {entry['remedy']}")], bad)
