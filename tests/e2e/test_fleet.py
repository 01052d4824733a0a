"""A fleet on real engines: two shards on loopback, and the data of several servers."""
import json
import os
import re
import signal
import socket
import ssl
import subprocess
import time
import unittest

from engine import PASSWORD, Relay, Shards
from expected import DAY, Tree, csv, facts, local_time, totals
from harness import (ALL, BUILD, ROOT, MailServer, ProductTest, call, make_files, needs_root,
                     private_mounts)

ACCOUNTS = {'root': 0, 'ann': 3001, 'bob': 3002}


def names_aside(text, server, volumes):
    """A fleet's CSV file with the names that its one server has for itself."""
    for path, name in volumes.items():
        text = text.replace(f'"{server}:{path}"'.encode(), f'"{name}"'.encode())
    return text.replace(f'{server}:'.encode(), b'')


class FleetTest(ProductTest):
    """Machines with a cluster that they send to, of `replicas` engines a shard."""
    replicas = 1

    @classmethod
    def setUpClass(cls):
        super().setUpClass()
        cls.shards = cls.make_engines()

    @classmethod
    def make_engines(cls):
        return Shards(cls, replicas=cls.replicas)

    def setUp(self):
        super().setUp()
        for engine in self.shards.engines:
            engine.ask('drop database if exists vornreport', 'default')

    def ctl(self, machine, *arguments, status=0):
        done = machine.shell('exec /usr/vorn/bin/vornctl "$@"' if not arguments else
                             'exec /usr/vorn/bin/vornctl ' + ' '.join(
                                 "'" + str(a).replace("'", "'\\''") + "'" for a in arguments))
        self.assertEqual(done.status, status, done.out + done.err + str(done.log_lines))
        return done

    def server(self, name, machine=None, **keys):
        """A machine that takes part in the fleet as `name`."""
        machine = machine or self.new_machine()
        machine.accounts(ACCOUNTS)
        machine.profile('daily', report_list=ALL, fleet='true', **keys)
        # By an address that isn't taken for this machine's, rows are compressed as for others.
        urls = self.shards.urls.replace('127.0.0.1', '127.1') if name == 'alpha' else self.shards.urls
        self.ctl(machine, 'fleet', 'set', '--url', urls, '--cluster', 'shards', '--server', name)
        return machine

    def send(self, machine):
        before = machine.report_folders('daily')
        done = machine.run('--report', 'daily')
        self.assertEqual((done.status, machine.status('daily')), (0, 'success'), done.log_lines)
        self.assertEqual(machine.leftovers(), [])
        folder = [path for path in machine.report_folders('daily') if path not in before][-1]
        self.assertEqual(facts(folder)['incidents'], [])
        return folder

    def report(self, machine, *arguments, status=0):
        done = self.ctl(machine, 'fleet', 'report', machine.base / 'fleet', *arguments,
                        status=status)
        folder = os.path.dirname(done.out.splitlines()[-1])
        self.assertTrue(folder.startswith(f'{machine.base}/fleet/2'), done.out)
        return type(machine.base)(folder)

    def fill(self, machine, seed=0):
        tree = Tree(machine)
        for i in range(40):
            tree.add('photos', f'{i % 7}/IMG_{i}.JPG', 1000 + i % 5 * 100 + seed, 'image',
                     3001 + i % 2, i * 9)
            tree.add('backup', f'copies/IMG_{i}.JPG', 1000 + i % 3 * 100, 'image', 3001, i * 2)
        for name in ('007', '7', '1e3', '1000', "it's", 'tab\there', 'line\nbreak', 'b\\n', 'ü\udcff',
                     '=1+1', '12345678901234567890', '12345678901234567891'):
            tree.add('photos', 'odd/' + name, 3, 'other', 0)
            tree.add('backup', 'odd/' + name, 3, 'other', 0, 200)
        return tree


class AnyFleet:
    """What holds with any engine."""

    @needs_root
    def test_fleet_of_one_is_the_server(self):
        for keys in ({}, {'duplicate_compare': 'true'}):
            with self.subTest(**keys):
                name = f'files{len(keys)}'
                m = self.server(name, volume_history='true', **keys)
                self.fill(m)
                self.ctl(m, 'fleet', 'init')
                self.send(m)
                make_files(m.base / 'shares/photos', {'new.iso': 1 << 20})
                own = self.send(m)
                made = self.report(m, '--servers', name)
                volumes = {v['path']: v['id'] for v in facts(own)['volumes']}
                self.assertEqual(sorted(p.name for p in (made / 'csv').iterdir()),
                                 sorted(p.name for p in (own / 'csv').iterdir()))
                for path in (own / 'csv').iterdir():
                    # The report on volumes calls them by their paths.
                    known = {} if path.stem == 'volume_usage' else volumes
                    self.assertEqual(
                        names_aside((made / 'csv' / path.name).read_bytes(), name, known),
                        path.read_bytes(), path.name)

    @needs_root
    def test_fleet_of_three_is_their_union(self):
        servers = {}
        for number, name in enumerate(('alpha', 'b-2', 'c.example')):
            machine = self.server(name)
            if not servers:
                self.ctl(machine, 'fleet', 'init')
            servers[name] = (machine, self.fill(machine, number))
        for machine, _ in servers.values():
            self.send(machine)
        first = servers['alpha'][0]
        made = self.report(first)
        files = [(f'{name}:{share}', *rest) for name, (_, tree) in servers.items()
                 for share, *rest in tree.files]
        now = time.time()
        expected = {
            'large_file': ('Share\tFile\tSize(Byte)', [
                (share, path, size) for share, path, size, *_ in files]),
            'least_modify': ('Share\tFile\tSize(Byte)\tModify Time', [
                (*file[:3], local_time(file[3])) for file in files if file[3] < now - 90 * DAY]),
            'most_modify': ('Share\tFile\tSize(Byte)\tModify Time', [
                (*file[:3], local_time(file[3])) for file in files if file[3] > now - 7 * DAY]),
            'file_owner': ('Owner\tShare\tFile Count\tSize(Byte)', [
                (owner, share, *amount) for (owner, share), amount in totals(
                    (({uid: name for name, uid in ACCOUNTS.items()}[file[4]], file[0]), file[2])
                    for file in files).items()]),
        }
        for report, (header, rows) in expected.items():
            lines = (made / f'csv/{report}.csv').read_bytes().splitlines()
            wanted = csv(header, rows).splitlines()
            self.assertEqual((lines[0], sorted(lines[1:])), (wanted[0], sorted(wanted[1:])), report)
        # By size, and by time in both directions.
        for report, column, step in (('large_file', 2, -1), ('least_modify', 3, 1),
                                     ('most_modify', 3, -1)):
            values = [line.split(b'\t')[column].strip(b'"') for line in
                      (made / f'csv/{report}.csv').read_bytes().splitlines()[1:]]
            values = [int(value) if column == 2 else value for value in values]
            self.assertEqual(values, sorted(values, reverse=step < 0), report)
        # Groups of one name and size, whatever server they lie on; 007 is 7.
        groups = {}
        for share, path, size, *_ in files:
            name = os.path.basename(path)
            name = {'007': '7', '1e3': '1000', '12345678901234567890': '1.2e19',
                    '12345678901234567891': '1.2e19'}.get(name, name)
            groups.setdefault((size, name), set()).add((share, path))
        lines = (made / 'csv/duplicate_file.csv').read_bytes().splitlines()[1:]
        found = {}
        for line in lines:
            number, share = line.split(b'\t')[:2]
            found.setdefault(number, []).append(share)
        self.assertEqual(sorted(len(group) for group in found.values()),
                         sorted(len(group) for group in groups.values() if len(group) > 1))
        # The facts: everything of all, by the names that the fleet gives.
        told = facts(made)
        own = [facts(machine.report_folders('daily')[-1]) for machine, _ in servers.values()]
        for key in ('shares', 'types', 'owners'):
            self.assertEqual(sum(entry['bytes'] for entry in told[key]),
                             sum(entry['bytes'] for facts_ in own for entry in facts_[key]), key)
        self.assertEqual({share['name'] for share in told['shares']},
                         {f'{name}:{share}' for name in servers for share in ('photos', 'backup')})
        self.assertEqual({volume['path'].split(':')[0] for volume in told['volumes']}, set(servers))
        self.assertEqual(told['incidents'], [])
        # Some of the servers only; and what isn't there.
        only = self.report(first, '--servers', 'b-2', '--reports', 'large_file,share_list')
        self.assertEqual([path.name for path in sorted((only / 'csv').iterdir())],
                         ['large_file.csv', 'share_list.csv'])
        self.assertEqual(facts(only)['owners'], None)
        self.assertIn('no complete run of server nobody', self.ctl(
            first, 'fleet', 'report', first.base / 'fleet', '--servers', 'nobody', status=1).err)
        # A server whose runs stay out, of a release that knows more; and what people see of all that.
        told = json.dumps({'format': 1, 'incidents': [
            {'level': 'warning', 'kind': 'of_tomorrow', 'what': 'it', 'text': 'look'}]})
        self.shards.ask("insert into run (server, profile, run, started, report) values "
                        f"('left', 'daily', 1, 1, '{told}')")
        page = self.report(first, status=3)
        self.assertEqual([(entry['kind'], entry['what']) for entry in facts(page)['incidents']],
                         [('server_overdue', 'left (daily)'), ('of_tomorrow', 'left: it')])
        done = subprocess.run(
            ['node', ROOT / 'tests/page/fleet.mjs'], stdout=subprocess.PIPE, stderr=subprocess.STDOUT,
            text=True, env=os.environ | {
                'VORN_PAGES': str(page.parent), 'VORN_FLEET': page.name,
                'VORN_FORMAT': str(BUILD / 'report_format.json'),
                'VORN_NODE_MODULES': str(BUILD / 'reportUI/page/node_modules')})
        self.assertEqual(done.returncode, 0, done.stdout)
        self.ctl(first, 'fleet', 'forget', 'left')
        # A server that goes.
        self.ctl(first, 'fleet', 'forget', 'b-2')
        self.assertEqual(self.shards.ask("select count() from file where server = 'b-2'"), '0\n')
        listed = json.loads(self.ctl(first, 'fleet', 'status', '--json').out)
        self.assertEqual([(run['server'], run['files']) for run in listed],
                         [(name, len(servers[name][1].files)) for name in ('alpha', 'c.example')])

    @needs_root
    def test_two_profiles_of_a_server_are_one_server(self):
        m = self.server('two', share_list='photos', limit_user='root,ann')
        m.profile('other', report_list=ALL, fleet='true', share_list='backup', limit_user='ann,bob')
        tree = self.fill(m)
        tree.add('photos', 'real', b'x' * 9000)
        tree.add('backup', 'real', b'x' * 5000)
        volume = '/tmp/quotas-on-a-volume-with-a-long-name'
        m.share('quotas', volume, inside=True)
        tool = m.base / 'repquota'
        own = []
        for profile, used in (('daily', 8), ('other', 9)):
            tool.write_text(f"#!/bin/sh\n[ $1 = {volume} ] || exit 1\ncat <<'END'\n*** Report\nUser used\n"
                            '-----\n' + ''.join(f'{user} -- {kib} 9 0 0 0 0 0\n' for user, kib in (
                                ('root', 3), ('ann', used), ('bob', 5))) + 'END\n')
            tool.chmod(0o755)
            if not own:
                m.options += ['--tmpfs', 4 << 20, volume, '--bind', tool,
                              os.path.realpath('/sbin/repquota')]
                self.ctl(m, 'fleet', 'init')
            m.run('--report', profile)
            own.append(facts(m.report_folders(profile)[-1]))
        made = self.report(m)
        told = facts(made)
        self.assertEqual(sorted(volume['path'] for volume in told['volumes']),
                         sorted('two:' + volume['path'] for volume in own[0]['volumes']))
        held = next(volume for volume in told['volumes'] if volume['explained'])
        self.assertEqual(held['explained'], sum(
            volume['explained'] for facts_ in own for volume in facts_['volumes']))
        self.assertEqual({cause['share'] for cause in held['filled_by'] if cause['kind'] == 'share'},
                         {'two:photos', 'two:backup'})
        # Of a user whom both tell of the newer one counts.
        users = {'root': 3, 'ann': 9, 'bob': 5}
        self.assertEqual({user['user']: user['used'] >> 10 for user in told['quotas']}, users)
        page = (made / 'report.html').read_text()
        rows = re.findall(r"^\['(\w+)', 9216, (\d+),", page.split('vornQuotaUsageTable = ')[1],
                          re.MULTILINE)
        self.assertEqual({user: int(used) >> 10 for user, used in rows}, users)
        self.assertEqual(len(rows), len(users))
        self.assertIn(f"\n[ 'two:{volume}', ", page)

    @needs_root
    def test_only_complete_runs_are_seen_and_the_newest_counts(self):
        m = self.server('seen')
        self.fill(m)
        self.ctl(m, 'fleet', 'init')
        # Tables as they were once.
        for engine in self.shards.engines:
            for table in ('run_part', 'run'):
                engine.ask(f'alter table vornreport.{table} drop column row_count')
        self.ctl(m, 'fleet', 'init')
        self.send(m)
        before = self.shards.ask('select server, max(run) from run group by server')
        # Killed between its rows and its line.
        m.stop_at('body 2')
        run = m.start('--report', 'daily')
        m.stopped_pid()
        os.kill(run.pid(), signal.SIGKILL)
        m.go_on()
        run.finish()
        self.assertEqual(self.shards.ask('select uniq(run) from file'), '2\n')
        self.assertEqual(self.shards.ask('select server, max(run) from run group by server'), before)
        files = json.loads(self.ctl(m, 'fleet', 'status', '--json').out)[0]['files']
        made = self.report(m, '--reports', 'large_file')
        self.assertEqual(len((made / 'csv/large_file.csv').read_bytes().splitlines()), files + 1)
        # The newest counts, once; others go when nobody can be reading them any more.
        self.send(m)
        newest = int(self.shards.ask("select max(run) from run where server = 'seen'"))
        # A clock that is ahead; a run that never got all of its rows; and a number of somebody else's.
        self.shards.ask(f"insert into file (server, profile, run) values ('other', 'daily', {newest})")
        self.shards.ask(f"insert into run (server, profile, run, started, row_count) values "
                        f"('ahead', 'daily', {newest * 2}, 1, 0), ('seen', 'daily', {newest + 2}, 1, 1)")
        made = self.report(m, '--reports', 'large_file', status=3)
        self.assertEqual(len((made / 'csv/large_file.csv').read_bytes().splitlines()), files + 1)
        self.assertIn("server ahead (daily) sent a run from the future, which doesn't count; set its "
                      'clock', [entry['text'] for entry in facts(made)['incidents']])
        for table in ('run', 'file'):
            self.shards.ask(f'insert into {table} (server, profile, run) values '
                            f"('seen', 'daily', 1), ('gone', 'daily', 1), ('seen', 'other', 1)")
        self.shards.ask("insert into run (server, profile, run, finished, started) values "
                        f"('seen', 'daily', {newest + 1}, 1, 1)")
        done = self.ctl(m, 'fleet', 'status', '--json')
        listed = {(run['server'], run['profile']): run['overdue'] for run in json.loads(done.out)}
        self.assertEqual(listed[('seen', 'daily')], True)
        self.assertEqual(self.shards.ask("select uniq(run) from file where server = 'seen' and "
                                         "profile = 'daily'"), '0\n')
        self.assertNotIn('ahead', [run['server'] for run in json.loads(done.out)])

    @needs_root
    def test_names_are_data_everywhere(self):
        hostile = [f"{a}{b}{c}" for a in ("'", '"', '\\', '`', "');") for b in (
            ' or 1=1 --', '\\n', '\n', '<script>x', '{runs}', '?a=b&c', ' drop table run; ')
            for c in ('', '\udcff')][:60]
        self.assertEqual(len(set(hostile)), 60)
        m = self.server("srv {runs} %27 & ü")
        tree = Tree(m)
        for name in hostile:
            tree.add('odd', name, 5)
        self.ctl(m, 'fleet', 'init')
        own = self.send(m)
        made = self.report(m)
        for path in (own / 'csv').iterdir():
            if path.stem not in ('volume_usage', 'coverage', 'share_list'):
                self.assertEqual((made / 'csv' / path.name).read_bytes().replace(
                    'srv {runs} %27 & ü:'.encode(), b''), path.read_bytes())
        # What other servers have written is theirs: it stays text, and can be forgotten.
        part = {'share': 'odd', 'volume': '/', 'files': 1, 'bytes': 7}
        known = json.dumps({'format': 1, 'owners': [{'name': 'ann', 'files': 1, 'bytes': 7, 'places': [part]}],
                            'types': [{'type': 'other', 'files': 1, 'bytes': 7, 'shares': [part]}]})
        for number, name in enumerate(hostile):
            if '\udcff' in name:
                continue
            text = name.replace('\\', '\\\\').replace("'", "\\'").replace('\n', '\\n')
            where = f"'{text}', 'daily', {number + 1}"
            self.shards.ask(f"insert into file (server, profile, run, share, path, size, owner_name) "
                            f"values ({where}, '{text}', '/{text}', 7, '{text}')")
            for report in ('folder_usage', 'file_age', 'coverage', 'growth'):
                self.shards.ask('insert into report_row (server, profile, run, report, value) values '
                                f"({where}, '{report}', [" + ', '.join([f"'{text}'"] * 7) + '])')
            self.shards.ask('insert into run (server, profile, run, started, report) values '
                            f"({where}, {int(time.time())}, '{known}')")
        made = self.report(m)
        self.assertNotIn('<script>x', (made / 'report.html').read_text(errors='surrogateescape'))
        # What the page adds up by share is all there, of however many servers.
        for key, parts in (('owners', 'places'), ('types', 'shares')):
            for entry in facts(made)[key]:
                self.assertEqual(sum(part['bytes'] for part in entry[parts]), entry['bytes'], key)
        for name in hostile:
            if '\udcff' not in name:
                self.ctl(m, 'fleet', 'forget', name)
        self.assertEqual(self.shards.ask('select uniq(server) from run'), '1\n')

    @needs_root
    def test_what_is_others_stays_and_what_is_renamed_moves(self):
        m = self.server('guest')
        files = len(self.fill(m).files)
        self.ctl(m, 'fleet', 'init')
        self.send(m)
        folder = m.base / 'fleet'
        kept = [folder / name for name in ('template', '.notes.partial', 'csv')]
        for path in kept:
            path.mkdir(parents=True)
            (path / 'mine').touch()
        (folder / '.2020-01-02_03-04-05.partial').mkdir()
        made = self.report(m)
        self.assertTrue(all((path / 'mine').exists() for path in kept))
        self.assertEqual(sorted(path.name for path in made.iterdir()),
                         sorted(path.name for path in m.report_folders('daily')[-1].iterdir()))
        self.assertEqual([path.name for path in folder.glob('.2*')], [])
        for arguments, words in (((m.reports / 'daily',), 'the reports of profile daily'),
                                 ((folder, '--reports', 'large_file,grwth'), 'did you mean "growth"')):
            self.assertIn(words, self.ctl(m, 'fleet', 'report', *arguments, status=1).err)
        before = [self.shards.ask(f'select profile, count() from {table} group by profile')
                  for table in ('file', 'report_row', 'run')]
        self.assertEqual(before[0], f'daily\t{files}\n')
        self.ctl(m, 'profile', 'rename', 'daily', 'nightly')
        self.assertEqual([self.shards.ask(f'select profile, count() from {table} group by profile')
                          for table in ('file', 'report_row', 'run')],
                         [rows.replace('daily', 'nightly') for rows in before])
        self.assertEqual(facts(self.report(m))['incidents'], [])
        self.ctl(m, 'fleet', 'forget', 'guest', 'daily', status=1)
        self.ctl(m, 'fleet', 'forget', 'guest', 'nightly')
        self.assertEqual(self.shards.ask('select count() from run'), '0\n')


class Fleet(AnyFleet, FleetTest):
    @needs_root
    def test_an_engine_in_trouble_costs_the_report_nothing(self):
        silent = socket.create_server(('127.0.0.1', 0))
        self.addCleanup(silent.close)
        m = self.server('trouble')
        self.fill(m)
        self.ctl(m, 'fleet', 'init')
        conf = m.vorn / 'etc/fleet.conf'
        secret = m.vorn / 'etc/secret'
        secret.write_text('wrong\n')
        secret.chmod(0o600)
        good = conf.read_text()
        url = self.shards.engines[0].url
        for what, text, words in (
                ('nobody listens', '[fleet]\nurl = http://127.0.0.1:1/\n', "can't be used"),
                ('silence', f'[fleet]\nurl = http://127.0.0.1:{silent.getsockname()[1]}/\n',
                 "can't be used"),
                ('wrong password', f'[fleet]\nurl = {url}\nuser = careful\n'
                                   'password_file = /usr/vorn/etc/secret\n', 'password'),
                ('no tables', f'[fleet]\nurl = {url}\ndatabase = nothing\n', 'refused'),
                ('not understood', '[fleet]\nurls = x\n', 'urls is unknown'),
                ('none', '', 'no engine is configured')):
            with self.subTest(what):
                conf.write_text(text)
                begin = time.monotonic()
                run = m.start('--report', 'daily')
                out, err = run.process.communicate(timeout=120)
                self.assertEqual((run.process.returncode, m.status('daily')), (0, 'success'), err)
                self.assertLess(time.monotonic() - begin, 60)  # bounded, however slow the machine
                told = facts(m.report_folders('daily')[-1])['incidents']
                self.assertEqual([entry['kind'] for entry in told], ['fleet_unreachable'])
                self.assertIn(words, told[0]['text'])
                self.assertEqual(m.leftovers(), [])
        conf.write_text(good)
        secret.write_text(PASSWORD + '\n')
        self.ctl(m, 'fleet', 'set', '--user', 'careful', '--password-file', '/usr/vorn/etc/secret')
        self.send(m)

    @needs_root
    def test_an_engine_in_trouble_half_way(self):
        m = self.server('half')
        files = len(self.fill(m).files)
        self.ctl(m, 'fleet', 'init')
        good = (m.vorn / 'etc/fleet.conf').read_text()
        for ways in ({'cut': 900}, {'delay': 2}):
            relay = Relay(self, self.shards.engines[0], **ways)
            (m.vorn / 'etc/fleet.conf').write_text(re.sub(
                'url = .*', f'url = http://127.0.0.1:{relay.port}/', good))
            self.send(m)
            self.assertEqual(self.shards.ask('select count() from file where run global in '
                                             '(select max(run) from run)'), f'{files}\n', ways)
        (m.vorn / 'etc/fleet.conf').write_text(good)
        # Gone while the page is made: there again in time for the run's line, or not. What the
        # page can't tell any more, others do.
        mails = MailServer(self, m.base / 'mails')
        text = m.config.read_text()
        for comes_back, mail in ((True, False), (False, False), (False, True)):
            with self.subTest(comes_back=comes_back, mail=mail):
                m.config.write_text(text + (
                    f'mail_to = a@b.example\nsmtp_url = smtp://127.0.0.1:{mails.port}\n' * mail))
                before = self.shards.ask('select max(run) from run')
                m.stop_at('body 2')
                run = m.start('--report', 'daily')
                m.stopped_pid()
                for engine in self.shards.engines:
                    engine.stop()
                    if comes_back:
                        engine.start()
                m.go_on()
                run.finish()
                for engine in self.shards.engines:
                    if not comes_back:
                        engine.start()
                self.assertEqual((run.status, m.status('daily')), (0, 'success'), run.err)
                self.assertEqual(facts(m.report_folders('daily')[-1])['incidents'], [])
                for told in (mails.mails()[-1].get_body(('plain',)).get_content() if mail else run.err,
                             self.ctl(m, 'status', 'daily').out):
                    self.assertEqual('missing from the fleet' in told, not comes_back, told)
                self.assertEqual('vornreport: ' in run.err, not comes_back and not mail, run.err)
                self.assertEqual(self.shards.ask('select max(run) from run') > before, comes_back)

    @needs_root
    def test_the_way_is_verified(self):
        m = self.server('far')
        self.fill(m)
        key, ca = m.base / 'key', m.base / 'ca'
        call('openssl', 'req', '-x509', '-newkey', 'ec', '-pkeyopt', 'ec_paramgen_curve:P-256', '-nodes',
             '-subj', '/CN=engine', '-addext', 'subjectAltName=DNS:localhost', '-keyout', key, '-out', ca)
        context = ssl.create_default_context(ssl.Purpose.CLIENT_AUTH)
        context.load_cert_chain(ca, key)
        port = Relay(self, self.shards.engines[0], tls=context).port
        trust = ['--bind', ca, '/etc/ssl/certs/ca-certificates.crt']
        before, known = (m.vorn / 'etc/fleet.conf').read_text(), m.options
        for host, options, words in (('localhost', [], 'self-signed certificate'),
                                     ('127.0.0.1', trust, 'subject name'), ('localhost', trust, '')):
            with self.subTest(host, words=words):
                m.options = known + options
                done = self.ctl(m, 'fleet', 'set', '--url', f'https://{host}:{port}/',
                                '--cluster', '', status=1 if words else 0)
                self.assertIn(words, done.err)
                self.assertEqual((m.vorn / 'etc/fleet.conf').read_text() == before, bool(words))
                if words:
                    self.assertRegex(done.err, r'^vornctl: [^\n]*update-ca-certificates[^\n]*\n$')
        self.ctl(m, 'fleet', 'init')
        self.send(m)
        self.report(m)

    @needs_root
    def test_a_shard_that_is_down_or_full(self):
        private_mounts()
        disk = self.m.base / 'disk'
        disk.mkdir()
        subprocess.run(['mount', '-t', 'tmpfs', '-o', 'size=24m', 'tmpfs', disk], check=True)
        self.addCleanup(subprocess.run, ['umount', '-l', disk], check=True)
        shards = Shards(self, folders=[None, disk])
        servers = {}
        for name in ('one', 'two', 'three', 'four', 'five', 'six'):
            m = servers[name] = self.server(name)
            self.ctl(m, 'fleet', 'set', '--url', shards.urls)
            files = len(self.fill(m).files)
        self.ctl(m, 'fleet', 'init')
        for m in servers.values():
            self.send(m)
        second = [name for name in servers if f'{name}\n' in shards.engines[1].ask(
            'select distinct server from run_part', 'vornreport')]
        self.assertTrue(0 < len(second) < len(servers), second)
        # No room: what fails half-way is sent to the other shard.
        (disk / 'ballast').write_bytes(bytes(1 << 20))
        with open(disk / 'ballast', 'ab') as ballast, self.assertRaises(OSError):
            while True:
                ballast.write(bytes(1 << 16))
                ballast.flush()
        m = servers[second[0]]
        self.send(m)
        (disk / 'ballast').unlink()
        self.report(m)
        # A shard that is down: no report of what is left, but runs go on to another one.
        shards.engines[1].stop()
        self.send(m)
        self.assertIn('the report over the fleet failed', self.ctl(
            m, 'fleet', 'report', m.base / 'fleet', status=1).err)
        shards.engines[1].start()
        made = self.report(m)
        self.assertEqual(sum(share['files'] for share in facts(made)['shares']),
                         files * len(servers))

    @needs_root
    def test_a_password_stays_on_this_machine(self):
        m = self.server('careful')
        secret = m.vorn / 'etc/secret'
        secret.write_text(PASSWORD + '\n')
        # An address of this machine that isn't loopback's.
        with socket.socket(socket.AF_INET, socket.SOCK_DGRAM) as probe:
            try:
                probe.connect(('192.0.2.1', 9))  # which sends nothing
            except OSError:
                self.skipTest('this machine has no address but loopback')
            address = probe.getsockname()[0]
        listening = socket.create_server((address, 0))
        self.addCleanup(listening.close)
        listening.setblocking(False)
        options = ('--user', 'careful', '--password-file', '/usr/vorn/etc/secret', '--cluster', '')
        url = f'http://{address}:{listening.getsockname()[1]}/'
        for mode, addressed, words in ((0o644, self.shards.engines[0].url, 'read or changed'),
                                       (0o600, url, "the password isn't sent")):
            secret.chmod(mode)
            before = (m.vorn / 'etc/fleet.conf').read_text()
            self.assertIn(words, self.ctl(m, 'fleet', 'set', '--url', addressed, *options,
                                          status=1).err)
            self.assertEqual((m.vorn / 'etc/fleet.conf').read_text(), before)
        with self.assertRaises(BlockingIOError):
            listening.accept()

    @needs_root
    def test_readme_leads_to_a_fleet(self):
        section = (ROOT / 'README.md').read_text().split('\n## Many servers\n')[1].split('\n## ')[0]
        lines = re.findall(r'^    # vornctl (.*?)(?: +#.*)?$', section, re.MULTILINE)
        self.assertEqual(len(lines), 5)
        m = self.m
        (m.base / 'srv').mkdir()
        m.options += ['--bind', m.base / 'srv', '/srv']
        m.profile('weekly', report_list=ALL)
        self.fill(m)
        for line in lines:
            line = line.replace('http://127.0.0.1:8123/', self.shards.engines[0].url)
            done = m.shell('exec /usr/vorn/bin/vornctl ' + line)
            self.assertEqual(done.status, 0, done.err)
        self.assertRegex(done.out, r'^/srv/fleet/[-_0-9]+/report\.html\n$')


if __name__ == '__main__':
    unittest.main()
