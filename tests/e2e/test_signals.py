"""SIGTERM, and standard channels that nobody listens to."""
import os
import signal
import socket
import subprocess

from harness import PROGRAM, ProductTest, Run, is_alive, make_files, wait_for

WALKING = 'walk'


class Signals(ProductTest):
    def setUp(self):
        super().setUp()
        make_files(self.m.share('photos'), {'a.jpg': 10})
        self.m.profile('weekly', report_list='share_list,large_file')

    def terminate(self, stop, fill=lambda: None, logged=1, **options):
        """Ends a run where it is: it says so once in its log and output, and clears up."""
        if stop != WALKING:
            self.m.stop_at(stop)
        run = self.m.start('--report', 'weekly', **options)
        program = run.pid()
        if stop == WALKING:
            wait_for(lambda: any((self.m.vorn / 'var/stat').rglob('stat.db')), 'the walk')
        child = None if stop == WALKING else self.m.stopped_pid()
        fill()
        os.kill(program, signal.SIGTERM)
        run.finish()
        self.assertEqual(run.status, 1)
        self.assertFalse(child and is_alive(child))
        self.assertEqual([path for path in self.m.leftovers() if self.m.reports not in path.parents],
                         [])
        self.assertNotEqual(self.m.status('weekly'), 'success')
        message = rf'(\([^()]+\))?Get SIGTERM, clean and exit, pid={program}\n'
        if 'stdout' not in options:
            self.assertEqual(run.out.count('SIGTERM'), 1)
            self.assertRegex(run.out, r'\(src/vornreport:559\)' + message)
        if logged:
            self.assertEqual(len(run.log_lines), 1, run.log_lines)
            self.assertRegex(run.log_lines[0], f'^src/vornreport:559 {message}\n?$')
        if child:
            self.m.go_on()

    def test_at_every_command(self):
        for stop in ('header 2', 'lang', 'body 2', 'header 3', 'body 3', 'tail'):
            with self.subTest(stop):
                self.terminate(stop)
                self.assertSucceeded(self.m.run('--report', 'weekly'), 'weekly',
                                     'vornreport: profile weekly: the run of .* did not finish: .*\n')

    def test_while_it_walks(self):
        make_files(self.m.share('many'), {f'{folder}/{name}': 1 for folder in range(50)
                                          for name in range(400)})
        self.terminate(WALKING)

    def test_with_a_log_or_an_output_that_nobody_reads(self):
        path = self.m.base / 'full'
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as unread, \
                socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as filler:
            unread.bind(str(path))
            filler.setblocking(False)
            self.fill_up(lambda: filler.sendto(b'x', str(path)))
            for log in (path, None):
                self.terminate('lang', log=log, logged=0)
        reader, writer = os.pipe()

        def fill():
            os.set_blocking(writer, False)
            self.fill_up(lambda: os.write(writer, b'x'))
            os.set_blocking(writer, True)
        self.terminate('lang', fill, stdout=writer)
        os.close(reader)
        os.close(writer)

    def fill_up(self, write):
        with self.assertRaises(BlockingIOError):
            while True:
                write()

    def test_a_report_needs_no_output(self):
        reader, writer = os.pipe()
        os.close(reader)
        for name, redirection in (('closed', '>&- 2>&- <&-'), ('full', '>/dev/full'),
                                  ('broken', '')):
            with self.subTest(name):
                command = ['/bin/sh', '-c', f'exec "$@" {redirection}', 'sh', PROGRAM, '--report',
                           'weekly']
                run = Run(self.m, command, self.m.new_log(),
                          stdout=writer if name == 'broken' else subprocess.PIPE).finish()
                self.assertSucceeded(run, 'weekly')
        os.close(writer)
