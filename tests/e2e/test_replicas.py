"""A fleet on replicas: two shards of two engines each, and the ZooKeeper that coordinates them."""
import json
import time
import unittest
import zlib
from concurrent.futures import ThreadPoolExecutor

import test_fleet
from engine import START
from expected import Tree, facts
from harness import needs_root


class Replicas(test_fleet.FleetTest):
    replicas = 2

    def setUp(self):
        super().setUp()
        # A server that sends its rows to the engine that it names first.
        self.name = next(name for name in map(str, range(99)) if zlib.crc32(name.encode()) %
                         len(self.shards.engines) == 0)
        self.a, self.b = self.shards.engines[:2]
        self.machine = self.server(self.name)
        self.tree = Tree(self.machine)
        self.tree.add('photos', 'first', 100)

    def ask_first(self, *engines):
        others = [engine for engine in self.shards.engines if engine not in engines]
        self.ctl(self.machine, 'fleet', 'set', '--url',
                 ','.join(engine.url for engine in (*engines, *others)))

    def until(self, condition, *arguments):
        end = time.monotonic() + START
        while not condition(*arguments):
            self.assertLess(time.monotonic(), end, arguments)
            time.sleep(0.1)

    def newest(self):
        """Files of the server's newest complete run, as the fleet's status tells."""
        listed = json.loads(self.ctl(self.machine, 'fleet', 'status', '--json').out)
        return sum(run['files'] for run in listed if run['server'] not in ('left', 'lost'))

    def files(self):
        """... and as its report does."""
        made = self.report(self.machine, '--servers', self.name, '--reports', 'large_file')
        rows = len((made / 'csv/large_file.csv').read_bytes().splitlines()) - 1
        self.assertEqual(self.newest(), rows)
        return rows

    @needs_root
    def test_half_a_run_is_never_seen(self):
        for _ in range(2):
            self.ctl(self.machine, 'fleet', 'init')
        self.assertEqual(self.b.ask("select engine from system.tables where name = 'file_part'"),
                         'ReplicatedMergeTree\n')
        self.send(self.machine)
        tables = {'file', 'run'}
        for table in sorted(tables):
            with self.subTest(table):
                seen = len(self.tree.files)
                self.until(lambda: self.newest() == seen)
                self.b.ask(f'system stop fetches vornreport.{table}_part')
                self.tree.add('photos', table, 100)
                self.send(self.machine)
                (other,) = tables - {table}
                newest = f'select max(run) from {other}_part'
                self.until(lambda: self.b.ask(newest, 'vornreport') == self.a.ask(newest, 'vornreport'))
                self.ask_first(self.b)
                self.assertEqual(self.files(), seen)
                self.a.stop(softly=True)
                self.assertEqual(self.files(), seen)
                self.a.start()
                self.b.ask(f'system start fetches vornreport.{table}_part')
                self.ask_first(self.a)
                # A further part wakes the one that would try again after some seconds only.
                self.shards.ask(f"insert into {table} (server, profile, run) values "
                                f"('{self.name}', 'daily', 1)")
        self.until(lambda: self.newest() == len(self.tree.files))
        self.assertEqual(self.files(), len(self.tree.files))

    @needs_root
    def test_what_changes_while_a_report_is_made(self):
        m = self.machine
        self.ctl(m, 'fleet', 'init')
        self.send(m)
        self.until(lambda: self.newest() == 1)
        self.a.stop(softly=True)
        for change, words in ((self.a.start, 'came back meanwhile; try again'),
                              (lambda: self.ctl(m, 'fleet', 'forget', self.name),
                               'a run was dropped or sent while the report was made')):
            with self.subTest(words), ThreadPoolExecutor() as beside:
                m.stop_at('lang')
                made = beside.submit(self.ctl, m, 'fleet', 'report', m.base / 'fleet', status=1)
                m.stopped_pid()
                change()
                m.go_on()
                self.assertIn(words, made.result().err)
                self.assertEqual(list((m.base / 'fleet').glob('2*')), [])

    @needs_root
    def test_what_is_gone_for_a_while(self):
        m = self.machine
        self.ctl(m, 'fleet', 'init')
        self.shards.ask("insert into run (server, profile, run, started, report) values "
                        "('left', 'daily', 1, 1, '{}'), ('lost', 'daily', 1, 1, '{}')")
        # A replica: rows are taken and dropped without it, and it gets all that once it is back.
        self.a.stop(softly=True)
        self.send(m)
        self.ctl(m, 'fleet', 'forget', 'left')
        self.assertEqual(self.files(), 1)
        self.a.start()
        self.until(lambda: self.newest() == 1)
        self.until(lambda: [engine.ask("select count() from run_part where server = 'left'", 'vornreport')
                            for engine in self.shards.engines] == ['0\n'] * 4)
        # Their coordinator: what is there is read, nothing is written, and that is said.
        self.shards.coordinator.stop()
        self.assertEqual(self.files(), 1)
        run = m.run('--report', 'daily')
        self.assertEqual((run.status, m.status('daily')), (0, 'success'))
        told = facts(m.report_folders('daily')[-1])['incidents']
        self.assertEqual([entry['kind'] for entry in told], ['fleet_unreachable'])
        self.assertIn('readonly', told[0]['text'])
        done = self.ctl(m, 'fleet', 'forget', 'lost', status=1)
        self.assertRegex(done.err, r'^vornctl: [^\n]*readonly[^\n]*\n$')
        self.shards.coordinator.start()
        self.until(lambda: '0' in self.a.ask('select is_readonly from system.replicas'))
        self.send(m)
        self.ctl(m, 'fleet', 'forget', 'lost')
        self.assertEqual(self.shards.ask('select uniq(run), count() from file'), '2\t2\n')

    @needs_root
    def test_nodes_that_do_not_fit(self):
        config = self.b.folder / 'config.xml'
        good = config.read_text()
        shard, replica = '<shard>0</shard><replica>', '<replica>1</replica></macros>'
        for what, old, new, urls, words in (
                ('no macro', shard, '<replica>', 4, 'has no macro shard'),
                ('another shard', shard, '<shard>2</shard><replica>', 4, 'macro shard of'),
                ('a replica twice', replica, '<replica>0</replica></macros>', 4, 'same macros'),
                ('no coordinator', 'zookeeper>', 'nothing>', 4, 'ZooKeeper'),
                ('too few', 'x', 'x', 3, 'has 4 nodes, but url names 3')):
            with self.subTest(what):
                self.b.stop()
                config.write_text(good.replace(old, new))
                self.b.start()
                self.ctl(self.machine, 'fleet', 'set', '--url',
                         ','.join(engine.url for engine in self.shards.engines[-urls:]))
                done = self.ctl(self.machine, 'fleet', 'init', status=1)
                self.assertRegex(done.err, rf'^vornctl: [^\n]*{words}[^\n]*\n$')
        self.ask_first(self.a)
        self.ctl(self.machine, 'fleet', 'init')


if __name__ == '__main__':
    unittest.main()
