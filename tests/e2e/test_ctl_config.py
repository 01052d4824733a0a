"""vornctl's commands for shares and profiles, on the staged product."""
import json
import os
import pty
import re
import select
import shutil
import sqlite3
import time
from unittest.mock import ANY

from harness import ALL, CTL, LIMIT, ROOT, CtlTest, Run, make_files, needs_root

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
        add, put = ('share', 'add'), ('share', 'set', 'one')
        self.check_table(self.m.shares, SHARES, (
            ((*add, 'Größe & mehr', '/etc//'), SHARES + '\n\n[Größe & mehr]\npath = /etc\n', ''),
            ((*add, 'x', '/etc', '--file-index', index, '--network'), SHARES +
             f'\n\n[x]\npath = /etc\nfile_index = {index}\nnetwork = yes\n', ''),
            ((*add, 'x', '/usr/bin'), SHARES + '\n\n[x]\npath = /usr/bin\n',
             'shares two and x hold the same files.*'),
            ((*add, 'x', '/proc'), SHARES + '\n\n[x]\npath = /proc\n', 'not walked .*set x --path'),
            ((*put, 'file_index', index, '--network'),
             SHARES.replace('comment\n', f'comment\n file_index = {index}\n network = yes\n'),
             "can't be found .*set one --path"),
            ((*put, 'path', '/proc/'), SHARES.replace('=/etc ; not a comment', ' = /proc'),
             'not walked '),
            ((*put, '--name', 'uno'), SHARES.replace('[one]', '[uno]'), ''),
            ((*put, '--name', 'two'), None, r'has a section \[two\] already'),
            ((*put, '--path', 'etc'), None, 'not absolute'),
            ((*put, 'network', 'maybe'), None, 'neither yes nor no'),
            ((*put, 'pth', '/etc'), None, '"pth" is no key'),
            (('share', 'set', 'three', '--network'), None, 'share list'),
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
                         {'name': '写真', 'path': '/etc', 'kind': ANY, 'network': False,
                          'file_index': None, 'state': 'fine', 'walked': True, 'overlaps': []})

    def test_renaming_is_followed_into_profiles(self):
        self.m.share('b')
        with self.m.shares.open('a') as file:
            file.write('network = yes\n')
        for name, shares in (('p', 'a, b ,c'), ('q', 'bb')):
            self.m.profile(name, report_list='share_list', share_list=shares)
        self.check(('share', 'set', 'b', '--name', 'new one'),
                   out='profile p now covers new one\n')
        text = self.m.config.read_text()
        self.assertIn('share_list = a,new one,c\n', text)
        self.assertIn('share_list = bb\n', text)
        self.assertRegex(self.m.shares.read_text(), r'\[new one\]\npath = .*\nnetwork = yes\n$')

    @needs_root  # a mount
    def test_two_ways_to_the_same_files(self):
        inside = self.m.base / 'shares/all/deep'
        inside.mkdir(parents=True)
        for name in ('all', 'bound', 'beside', 'linked'):
            (self.m.base / 'shares' / name).mkdir(exist_ok=True)
        (inside / 'link').symlink_to(inside.parent)
        self.m.options += ['--bind', inside, self.m.base / 'shares/bound']
        for name, folder in (('all', 'all'), ('bound', 'bound'), ('beside', 'beside'),
                             ('linked', 'all/deep/link')):
            self.m.share(name, self.m.base / 'shares' / folder)
        found = {share['name']: share['overlaps']
                 for share in json.loads(self.ctl('share', 'list', '--json').out)}
        self.assertEqual(found, {'all': ['bound', 'linked'], 'bound': ['all', 'linked'],
                                 'beside': [], 'linked': ['all', 'bound']})

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
        (self.m.tmp / 'open').mkdir()
        (self.m.tmp / 'open').chmod(0o770)
        before = self.GLOBAL + '[p]\n# why\n\treport_list = share_list\nown = 1\nlanguage=de\n'
        made = before + '\n[n]\nreport_list = '
        add, put = ('profile', 'add', 'n'), ('profile', 'set', 'p')
        self.check_table(self.m.config, before, (
            (add, f'{made}{ALL.replace("quota_usage,", "")}\nvolume_history = true\n', 'no volume has quotas'),
            ((*add, '--report-list', 'share_list', '--volume-history', 'false',
              '--duplicate-compare', 'true', '--duplicate-compare-minutes', '9'),
             made + 'share_list\nduplicate_compare = true\nduplicate_compare_minutes = 9\n'
             'volume_history = false\n', ''),
            ((*add, '--share-list', ''), None, 'share_list "" is an empty list'),
            ((*add, '--reports', ''), None, 'report_list "" is an empty list'),
            ((*put, '--language', 'fr', '--keep-reports', '2'),
             before.replace('language=de', 'language = fr\nkeep_reports = 2'), ''),
            ((*put, 'keep-reports', '2', 'own', ''),
             before.replace('own = 1\n', '').replace('=de\n', '=de\nkeep_reports = 2\n'), ''),
            (('profile', 'set', 'global', 'shares', 'photos'),
             before.replace('usage\n', 'usage\nshare_list = photos\n'), ''),
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
                ('report_list', 'large_fiel', 'mean "large_file"'),
                ('report_list', '', 'is an empty list'), ('report_list', ',', 'is an empty list'),
                ('share_list', ',,', 'is an empty list'), ('mail_to', ',', 'is an empty list'),
                ('report_list', 'share_list; larg_file', '"larg_file"'),
                ('share_list', 'photo', 'mean "photos"'), ('share_list', 'q', 'share add'),
                ('language', 'tlh', 'there are de, en'), ('mail_to', 'a@b, c', '"c" is no mail'),
                ('mail_from', 'a', 'no mail address'), ('smtp_url', 'http://x', 'smtp://host'),
                ('smtp_user', 'u', 'needs smtp_password_file'),
                ('smtp_password_file', '/etc/passwd', 'changed by others'),
                ('report_dir', 'r', 'not absolute'), ('report_dir', '/etc/passwd/r', 'no folder'),
                ('report_dir', '/tmp/open/r', 'is writable by others, .*; run chmod go-w'),
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
        self.m.config.write_text(self.GLOBAL + f'[p]\nreport_list = {ALL}\nmail_to = a@b\n'
                                 'keep_reports = 3\nvolume_history = TRUE\nlanguage = de\n')
        self.check(('profile', 'list'), out='PROFILE  SHARES  MAIL TO  REPORTS\n'
                                            'p        all     a@b      all\n')
        self.check(('profile', 'show', 'global'), out='KEY          VALUE\n'
                                                      'report_list  volume_usage\n')
        shown = {'name': 'p', 'report_list': ALL.split(','), 'mail_to': ['a@b'],
                 'keep_reports': 3, 'volume_history': True, 'language': 'de'}
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
        make_files(self.m.vorn / 'var/stat/p', {'stat.db': 1})
        make_files(report.parent / '.2026-01-02_03-04-05.partial', {'csv/x': 1})
        self.check(('profile', 'remove', 'p', '--reports-too'), 0, 'more than reports')
        self.assertEqual([path.name for path in report.parent.iterdir()], ['mine'])
        self.assertFalse(job.exists() or (self.m.vorn / 'var/status/p').exists())
        self.assertEqual(self.m.leftovers(), [])
        self.check(('profile', 'list'), 0, 'no profiles')
        self.m.profile('q', report_list='share_list')
        (self.m.cron / 'vornreport-none').write_text('0 4 * * * root backup\n')
        self.check(('profile', 'remove', 'q'))


    def test_copies_and_renames_take_all_along(self):
        self.m.share('s')
        self.m.profile('p', report_list='share_list,volume_usage', schedule_collect_id='p')
        job = self.m.cron / 'vornreport-p'
        job.write_text('0 4 * * 1 root /usr/vorn/bin/vornreport --report p\n')
        self.m.run('--data', 'p')
        report = self.assertSucceeded(self.m.run('--report', 'p'), 'p')

        def known():
            with sqlite3.connect(self.m.vorn / 'etc/vornreport.db') as db:
                return {name: (db.execute('select count(*) from VolumeUsage where profile = ?',
                                          (name,)).fetchone()[0] > 0,
                               db.execute('select count(*) from Snapshot where profile = ?',
                                          (name,)).fetchone()[0]) for name in ('p', 'q', 'r')}
        all_of_it, nothing = (True, 1), (False, 0)
        for action, name, message in (('rename', 'p', 'already'), ('copy', 'global', 'no profile'),
                                      ('rename', '.x', 'no profile name')):
            self.check(('profile', action, 'p', name), 1, message)
        self.check(('profile', 'copy', 'p', 'r', '--settings-only'))
        self.check(('profile', 'remove', 'r'))
        self.check(('profile', 'copy', 'p', 'q'))
        self.assertEqual(known(), {'p': all_of_it, 'q': all_of_it, 'r': nothing})
        (self.m.reports / 'r').mkdir()
        self.check(('profile', 'rename', 'p', 'r'), 1, 'File exists')
        self.assertIn('--report p ', job.read_text())
        (self.m.reports / 'r').rmdir()
        self.check(('profile', 'rename', 'p', 'r'))
        self.assertEqual(known(), {'p': nothing, 'q': all_of_it, 'r': all_of_it})
        for name in ('q', 'r'):
            stored = self.m.reports / name / report.name
            self.assertTrue((stored / 'report.html').exists() and (stored / 'csv').exists())
            self.assertIn(f'--report {name} ', (self.m.cron / f'vornreport-{name}').read_text())
        self.assertFalse(job.exists() or report.exists())
        self.assertEqual(self.m.status('r'), 'success')
        self.assertEqual(re.findall(r'^\[(.*)\]', self.m.config.read_text(), re.MULTILINE),
                         ['global', 'r', 'q'])
        self.check(('profile', 'remove', 'r', '--reports-too'))
        self.assertEqual(known(), {'p': nothing, 'q': all_of_it, 'r': nothing})


class Completion(ControlTest):
    def machine(self):
        for name in ('photos', 'my docs', 'music'):
            self.m.share(name)
        self.m.profile('weekly', report_list='share_list')
        for name in ('2026-01-02_03-04-05', '2026-02-03_03-04-05'):
            folder = self.m.reports / 'weekly' / name
            folder.mkdir(parents=True)
            (folder / 'report.html').write_text('<!DOCTYPE html>\n</html>\n')

    def test_in_real_shells(self):
        """Typed into bash and zsh on a terminal; the words that the line consists of afterwards."""
        self.machine()
        files = ROOT / 'packaging/completion'
        setup = {
            'bash --norc --noprofile -i':
                f'. /usr/share/bash-completion/bash_completion; . {files}/vornctl.bash',
            'zsh -f -i': f'fpath=({files} $fpath); autoload -U compinit; compinit -u -D; bindkey -e'}
        cases = (('ru', 'run'), ('help sh', 'help|share'), ('run w', 'run|weekly'),
                 ('share set pho', 'share|set|photos'), ('share set my', 'share|set|my docs'),
                 ('reports w', 'reports|weekly'), ('reports weekly rem', 'reports|weekly|remove'),
                 ('reports weekly open 2026-01', 'reports|weekly|open|2026-01-02_03-04-05'),
                 ('reports weekly compare 2026-01-02_03-04-05 2026-02',
                  'reports|weekly|compare|2026-01-02_03-04-05|2026-02-03_03-04-05'),
                 ('profile set weekly share_list photos,mus',
                  'profile|set|weekly|share_list|photos,music'),
                 ('profile add x --share-list photos,my', 'profile|add|x|--share-list|photos,my docs'),
                 ('profile set weekly --lang', 'profile|set|weekly|--language'))
        for shell, commands in setup.items():
            master, slave = pty.openpty()
            self.addCleanup(os.close, master)
            run = Run(self.m, ['setsid', '--ctty', 'env', 'TERM=dumb', 'HOME=/tmp', *shell.split()], None,
                      stdin=slave, stdout=slave, stderr=slave)
            os.close(slave)

            def answer(typed, end):
                os.write(master, typed.encode())
                shown, limit = '', time.monotonic() + LIMIT
                while not (found := re.search(end, shown)):
                    self.assertLess(time.monotonic(), limit, f'{shell}: {typed!r}: {shown!r}')
                    if select.select([master], [], [], 1)[0]:
                        shown += os.read(master, 4096).decode()
                return found
            answer(f"stty cols 400; PATH=/usr/vorn/bin:$PATH; {commands}; printf '%s!' DONE\n", 'DONE!')
            for typed, words in cases:
                with self.subTest(shell=shell, typed=typed):
                    # The line becomes the arguments of another command, which shows its words.
                    shown = answer(f"vornctl {typed}\t\x01printf '(%s)' \x05 END\n", r'(\(.*\))\(END\)')
                    self.assertEqual(shown[1], ''.join(
                        f'({word})' for word in ['vornctl', *words.split('|')]))
            os.write(master, b'exit\n')
            run.process.wait(LIMIT)

    def test_vornctl_knows_what_can_stand_where(self):
        self.machine()
        languages = self.m.vorn / 'vornreport/reportUI/template/lang'
        for name, text in (('de.bak.json', '{}'), ('de.json.bak', '{}'), ('dx.json', '{'),
                           ('dy.json', '[]'), ('dz.js', '{}'), ('da.json', '{}')):
            (languages / name).write_text(text)
        for words, expected in (
                ('sh', 'share'), ('share remove ', 'photos|my docs|music'), ('run w', 'weekly'),
                ('share add x ', '/folders'), ('profile set weekly lang', 'language'),
                ('profile set weekly language d', 'da|de'),
                ('profile set weekly language de volume_history ', 'true|false'),
                ('profile add x --reports large_file,q', 'large_file,quota_usage'),
                ('profile add x --shares music,', 'music,photos|music,my docs'),
                ('reports ', 'weekly'), ('reports weekly ', 'list|open|compare|remove|keep'),
                ('reports weekly remove --', '--help|--older-than|--dry-run'),
                ('reports weekly remove 2026-0', '2026-01-02_03-04-05|2026-02-03_03-04-05'),
                ('help reports ', 'list|open|compare|remove|keep'),
                ('profile add x --rep', '--report-list|--report-dir'), ('profile show weekly ', '')):
            with self.subTest(words):
                run = self.ctl('complete', *words.split(' '))
                self.assertEqual((run.out.splitlines(), run.err),
                                 (list(filter(None, expected.split('|'))), ''))
