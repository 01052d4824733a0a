"""vornctl's commands for shares and profiles, on the staged product."""
import json
import os
import shutil

from harness import ALL, CTL, CtlTest, Run, needs_root

SHARES = '# top\n\n# of one\n[one]\n path=/etc ; not a comment\n\n[two]\npath = /usr\n# end'


class ControlTest(CtlTest):
    def check_table(self, file, before, cases):
        """Each case: arguments, the file after them or None when they are refused with `message`."""
        for arguments, after, message in cases:
            with self.subTest(arguments):
                file.write_text(before)
                file.chmod(0o640)
                self.check(arguments, 1 if after is None else 0, message)
                self.assertEqual(file.read_text(), before if after is None else after)
                self.assertEqual(file.stat().st_mode & 0o777, 0o640)


class Shares(ControlTest):
    def test_each_change_and_refusal(self):
        index = '/usr/vorn/vornreport/sql/vornreport.sql'
        self.m.profile('p', report_list='share_list', share_list='x, two')
        add = 'share', 'add'
        self.check_table(self.m.shares, SHARES, (
            ((*add, 'Größe & mehr', '/etc//'), SHARES + '\n\n[Größe & mehr]\npath = /etc\n', ''),
            ((*add, 'x', '/etc', '--file-index', index, '--network'), SHARES +
             f'\n\n[x]\npath = /etc\nfile_index = {index}\nnetwork = yes\n', ''),
            ((*add, 'x', '/usr'), SHARES + '\n\n[x]\npath = /usr\n', 'count twice'),
            (('share', 'remove', 'one'), SHARES.replace('[one]\n path=/etc ; not a comment\n\n',
                                                        '\n'), ''),
            (('share', 'remove', 'two', '--force'), SHARES.replace('[two]\npath = /usr\n', ''),
             'share_list of p still'),
            (('share', 'remove', 'two'), None, 'share_list of p;'),
            (('share', 'remove', 'three'), None, r'no section \[three\]'),
            ((*add, 'one', '/etc'), None, r'has a section \[one\] already'),
            *(((*add, name, '/etc'), None, message) for name, message in (
                ('a]', 'bracket'), ('#a', 'comment sign'), ('a\n[b]', 'control'), ('a ', 'blank'),
                (b'a\xff', 'not UTF-8'), ('7', 'number'), ('a/b', 'quote, backslash, < > /'),
                ('', '1 to 64'))),
            *(((*add, 'x', path), None, message) for path, message in (
                ('etc', 'not absolute'), ('/etc/passwd', 'no folder'), ('/none', 'No such file'),
                (b'/\xff', 'not UTF-8'), ('/\n', 'control'), ("/'", 'single quote'))),
            ((*add, 'x', '/etc', '--file-index', '/none'), None, 'is no file')))

    def test_wrong_usage_is_told_from_failure(self):
        for arguments in ((), ('share',), ('share', 'add', 'x'), ('share', 'list', '--jsn')):
            self.check(arguments, 2, 'vornctl --help')

    def test_lists_align_and_show_what_could_harm_a_terminal(self):
        self.m.shares.write_bytes('[写真]\npath=/etc\n[b]\npath=/a\x1b[31m\n'.encode())
        run = self.ctl('share', 'list')
        lines = run.out.splitlines()
        columns = lines[0].index('FOLDER'), lines[1].index('/etc') + len('写真')
        self.assertEqual(*columns, run.out)
        self.assertNotIn('\x1b', run.out)
        self.assertIn('control character', lines[2])
        self.assertEqual(json.loads(self.ctl('share', 'list', '--json').out)[0],
                         {'name': '写真', 'path': '/etc', 'file_index': '', 'state': 'fine'})

    def test_writers_at_once_lose_nothing(self):
        self.m.shares.write_text('')
        runs = [Run(self.m, [CTL, 'share', 'add', f's{n}', '/etc'], None) for n in range(12)]
        self.assertEqual({run.finish().status for run in runs}, {0})
        self.assertEqual(set(self.m.shares.read_text().replace('\npath = /etc\n', '').split()),
                         {f'[s{n}]' for n in range(12)})

    def test_full_disk_keeps_the_file(self):
        self.m.options += ['--tmpfs', '8192', '/usr/vorn/etc']
        run = self.m.shell(f'cd /usr/vorn/etc && echo "#" >share.conf && head -c 4096 /dev/zero >fill'
                           f' && {CTL} share add x /etc; cat share.conf; ls -A')
        self.assertEqual(run.out, '#\n.share.conf.lock\nfill\nshare.conf\n')
        self.assertRegex(run.err, 'share.conf is unchanged.*No space left')


class Samba(ControlTest):
    def setUp(self):
        super().setUp()
        samba = self.m.base / 'samba'
        self.users = samba / 'usershares'
        self.users.mkdir(parents=True)
        self.users.chmod(0o1770)
        self.folder = self.m.base / 'a b'
        self.folder.mkdir()
        (self.m.base / 'smb.conf').write_text(f'''
[global]
    usershare max shares = 9
    server role = standalone
[printers]
    path = /etc
[homes]
[plain]
    Directory = "{self.folder}"
[There]
    path = /etc
[off]
    path = /etc
    AVAILABLE = 0
[paper]
    path = /etc
    Print Ok = true
[each]
    path = /srv/%U
[lost]
    path = /none
[8]
    path = /etc
''')
        self.m.shares.write_text('[there]\npath = /etc\n')
        self.m.options += ['--bind', self.m.base / 'smb.conf', '/etc/samba/smb.conf',
                           '--bind', samba, '/var/lib/samba']

    decisions = (('skipped', 'printers', 'it is for printers'),
                 ('skipped', 'homes', 'it stands for the home folders of all users'),
                 ('imported', 'plain', None),
                 ('skipped', 'There', 'there is a share of this name already'),
                 ('skipped', 'off', 'it is not available'),
                 ('skipped', 'paper', 'it is for printers'),
                 ('skipped', 'each', 'its path /srv/%U is another one for each user or client'),
                 ('skipped', 'lost', "its path can't be found (No such file or directory)"),
                 ('skipped', '8', 'it is a number, which the report would write in another form'))

    def lines(self, decisions, word='imported'):
        return [f'{verb.replace("imported", word)} {name}: {text or self.folder}'
                for verb, name, text in decisions]

    def test_smb_conf_as_testparm_reads_it(self):
        before = self.m.shares.read_text()
        after = f'{before}\n[plain]\npath = {self.folder}\n'
        again = [('skipped', 'plain', self.decisions[3][2]) if name == 'plain' else (verb, name, text)
                 for verb, name, text in self.decisions]
        for option, lines, text in (
                (['--dry-run'], self.lines(self.decisions, 'would import'), before),
                ([], self.lines(self.decisions), after), ([], self.lines(again), after)):
            run = self.ctl('share', 'import-samba', *option)
            self.assertEqual(run.out.splitlines(), lines, run.err)
            self.assertEqual(self.m.shares.read_text(), text)

    @needs_root  # Samba trusts no other's folder of user shares
    def test_shares_of_users(self):
        # With "net" and, where that is missing, from its files.
        for name, folder in (('7', '/etc'), ('mine', self.folder)):
            (self.users / name).write_text(
                f'#VERSION 2\npath={folder}\ncomment=\nusershare_acl=S-1-1-0:F\nguest_ok=n\n'
                f'sharename={name.title()}\n')
        number = 'skipped', '7', self.decisions[-1][2]
        programs = self.m.base / 'programs'
        programs.mkdir()
        (programs / 'testparm').symlink_to(shutil.which('testparm'))
        odd = ('skipped', r'b\x0ac', 'it holds a control character')
        for path, more in ((os.environ['PATH'], ()), (programs, (odd,))):
            if more:
                (self.users / 'b\nc').write_text('path=/etc\n')
            for option, users, end in (
                    ('', (), 'left out 1 that users have made, who can lead them anywhere; '
                     '--usershares takes these as well\n'),
                    (' --usershares', (number, ('imported', 'Mine', None), *more), '')):
                self.m.shares.write_text('[there]\npath = /etc\n')
                run = self.m.shell(f"PATH='{path}' {CTL} share import-samba{option}")
                self.assertEqual(run.out, ''.join(
                    line + '\n' for line in self.lines((*self.decisions, *users))) + end, run.err)


class Profiles(ControlTest):
    GLOBAL = '# top\n[global]\nreport_list = volume_usage\n'

    def test_each_change_and_refusal(self):
        self.m.share('photos')
        self.m.share('my docs')
        secret = self.m.tmp / 'secret'
        secret.write_text('x\n')
        secret.chmod(0o600)
        before = self.GLOBAL + '[p]\n# why\n\treport_list = share_list\nown = 1\nlanguage=de\n'
        made = before + '\n[n]\nreport_list = '
        add, put = ('profile', 'add', 'n'), ('profile', 'set', 'p')
        self.check_table(self.m.config, before, (
            (add, f'{made}{ALL.replace("quota_usage,", "")}\nvolume_history = true\n', 'no volume has quotas'),
            ((*add, '--reports', 'large_file, share_list', '--shares', 'my docs,photos', '--language',
              'de-AT', '--mail-to', 'a@b.c ,d@e.f', '--mail-from', 'v@b.c', '--smtp-url',
              'smtps://m:465', '--smtp-user', 'u', '--smtp-password-file', '/tmp/secret',
              '--report-dir', '/tmp/new/r', '--link-base', 'https://x/r', '--limit-user', 'root',
              '--duplicates', 'content', '--keep-reports', '3', '--no-history'),
             made + 'large_file,share_list\nshare_list = my docs,photos\nlanguage = de-AT\n'
             'report_dir = /tmp/new/r\nlink_base = https://x/r\nmail_to = a@b.c,d@e.f\n'
             'mail_from = v@b.c\nsmtp_url = smtps://m:465\nsmtp_user = u\n'
             'smtp_password_file = /tmp/secret\nlimit_user = root\nduplicate_compare = true\n'
             'keep_reports = 3\n', ''),
            ((*put, 'language', 'fr', 'keep_reports', '2'),
             before.replace('language=de', 'language = fr\nkeep_reports = 2'), ''),
            ((*put, 'report_list', 'large_file_db;share_list', 'duplicate_compare', 'TRUE'),
             before.replace('report_list = share_list', 'report_list = large_file_db;share_list')
             + 'duplicate_compare = TRUE\n', ''),
            ((*put, 'language', ''), before.replace('language=de\n', ''), ''),
            (('profile', 'remove', 'p'), self.GLOBAL, ''),
            *((('profile', 'add', name), None, message) for name, message in (
                ('p', 'already'), ('global', 'no profile'), ('a b', 'no profile name'),
                ('a]\n[b', 'no profile name'), ('.a', 'no profile name'))),
            *(((*put, key, value), None, message) for key, value, message in (
                ('report_list', 'large_fiel', 'mean "large_file"'), ('report_list', '', 'empty'),
                ('report_list', 'share_list; larg_file', '"larg_file"'),
                ('share_list', 'photo', 'mean "photos"'), ('share_list', 'q', 'share add'),
                ('language', 'tlh', 'there are de, en'), ('mail_to', 'a@b, c', '"c" is no mail'),
                ('mail_from', 'a', 'no mail address'), ('smtp_url', 'http://x', 'smtp://host'),
                ('smtp_user', 'u', 'needs smtp_password_file'),
                ('smtp_password_file', '/etc/passwd', 'open to every user'),
                ('report_dir', 'r', 'not absolute'), ('report_dir', '/etc/passwd/r', 'no folder'),
                ('link_base', 'x', 'http'), ('limit_user', 'nobody,rot', '"rot" is no user'),
                ('language', "de-'", 'not installed'),
                ('duplicate_compare', '1', 'true nor false'), ('keep_reports', '0', 'from 1 on'),
                ('duplicate_compare_minutes', '-1', 'no whole number'),
                ('schedule_collect_id', 'a.b', 'identifier'), ('mail_t', 'x', 'mean "mail_to"'),
                ('mail_from', 'a@b\nc = d', 'line break'), (b'limit_user', b'\xff', 'not UTF-8'))),
            ((*put, 'language', 'fr', 'mail_to', 'x'), None, 'no mail address'),
            (('profile', 'set', 'q', 'language', 'fr'), None, 'profile list'),
            (('profile', 'remove', 'global'), None, 'no profile')))

    def test_show_and_list(self):
        self.m.config.write_text(self.GLOBAL + f'[p]\nreport_list = {ALL}\nmail_to = a@b\n')
        self.check(('profile', 'list'), out='PROFILE  SHARES  MAIL TO  REPORTS\n'
                                            'p        all     a@b      all\n')
        self.check(('profile', 'show', 'global'), out='KEY          VALUE\n'
                                                      'report_list  volume_usage\n')
        shown = {'name': 'p', 'report_list': ALL, 'mail_to': 'a@b'}
        self.assertEqual(json.loads(self.ctl('profile', 'show', 'p', '--json').out), shown)
        self.assertEqual(json.loads(self.ctl('profile', 'list', '--json').out), [shown])

    def test_removing_leaves_no_schedule_and_only_what_is_no_report(self):
        self.m.profile('p', report_list='share_list', schedule_collect_id='p')
        self.m.share('s')
        job = self.m.cron / 'vornreport-p'
        report = self.assertSucceeded(self.m.run('--report', 'p'), 'p')
        self.m.stop_at('lang')
        running = self.m.start('--report', 'p')
        self.m.stopped_pid()
        self.check(('profile', 'remove', 'p', '--reports-too'), 1, 'is running')
        self.m.go_on()
        running.finish()
        job.write_text('0 4 * * * root /usr/vorn/bin/vornreport --report other\n')
        self.check(('profile', 'remove', 'p', '--reports-too'), 1, 'other jobs')
        self.assertTrue((report / 'report.html').exists())
        job.write_text('0 4 * * * root /usr/vorn/bin/vornreport --report p\n')
        (report.parent / 'mine').touch()
        self.check(('profile', 'remove', 'p', '--reports-too'), 0, 'more than reports')
        self.assertEqual([path.name for path in report.parent.iterdir()], ['mine'])
        self.assertFalse(job.exists() or (self.m.vorn / 'var/status/p').exists())
        self.check(('profile', 'list'), 0, 'no profiles')
        self.m.profile('q', report_list='share_list')
        (self.m.cron / 'vornreport-none').write_text('0 4 * * * root backup\n')
        self.check(('profile', 'remove', 'q'))


class Completion(ControlTest):
    def test_vornctl_knows_what_can_stand_where(self):
        self.m.share('photos')
        self.m.share('my docs')
        self.m.profile('weekly', report_list='share_list')
        languages = self.m.vorn / 'vornreport/reportUI/template/lang'
        for name, text in (('de.bak.json', '{}'), ('de.json.bak', '{}'), ('dx.json', '{'),
                           ('dy.json', '[]'), ('dz.js', '{}'), ('da.json', '{}')):
            (languages / name).write_text(text)
        for words, expected in (
                ('sh', 'share'), ('share remove ', 'photos|my docs'), ('run w', 'weekly'),
                ('share add x ', '/folders'), ('profile set weekly lang', 'language'),
                ('profile set weekly language d', 'da|de'),
                ('profile set weekly language de volume_history ', 'true|false'),
                ('profile add x --reports large_file,q', 'large_file,quota_usage'),
                ('profile add x --rep', '--reports|--report-dir'), ('profile show weekly ', '')):
            with self.subTest(words):
                run = self.ctl('complete', *words.split(' '))
                self.assertEqual((run.out.splitlines(), run.err),
                                 (list(filter(None, expected.split('|'))), ''))
