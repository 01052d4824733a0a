"""SIGTERM, and standard channels that nobody listens to."""
import os
import socket
import subprocess
import unittest

from harness import PROGRAM, ProductTest, Run, is_alive, make_files, page_rows, signal

TERMINATED = r'\(src/vornreport:559\)(\([^()]+\))?Get SIGTERM, clean and exit, pid=(\d+)\n'
TERMINATED_LOG = r'src/vornreport:559 (\([^()]+\))?Get SIGTERM, clean and exit, pid=(\d+)\n'


class Sigterm(ProductTest):
    def setUp(self):
        super().setUp()
        make_files(self.m.share('photos'), {'a.jpg': 10})
        self.m.profile('weekly', report_list='share_list,large_file')

    def terminate(self, stop, **options):
        self.m.stop_at(stop)
        run = self.m.start('--report', 'weekly', **options)
        child = self.m.stopped_pid()
        program = run.pid()
        os.kill(program, signal.SIGTERM)
        run.finish()
        self.assertEqual(run.status, 1)
        self.assertFalse(is_alive(child))
        self.assertNoTemporaries()
        self.assertNotEqual(self.m.status('weekly'), 'success')
        self.m.go_on()
        return run, program

    def assertNoTemporaries(self):
        self.assertEqual(list(self.m.tmp.glob('vornreport_*')), [])
        self.assertEqual(list((self.m.vorn / 'var/stat').iterdir()), [])

    def test_at_every_command(self):
        for stop in ('header 2', 'lang', 'body 2', 'header 3', 'body 3', 'tail'):
            with self.subTest(stop):
                run, program = self.terminate(stop)
                self.assertEqual(run.out.count('SIGTERM'), 1)
                self.assertRegex(run.out, TERMINATED)
                self.assertIn(f'pid={program}\n', run.out)
                self.assertEqual(len(run.log_lines), 1, run.log_lines)
                self.assertRegex(run.log_lines[0], f'^{TERMINATED_LOG}?$')
                self.assertSucceeded(self.m.run('--report', 'weekly'), 'weekly')

    def test_while_it_walks(self):
        many = self.m.share('many')
        make_files(many, {f'{folder}/{name}': 1 for folder in range(50) for name in range(200)})
        run = self.m.start('--report', 'weekly')
        run.read_until(b'stat share=many')
        run.signal(signal.SIGTERM)
        run.finish()
        self.assertEqual((run.status, len(run.log_lines)), (1, 1))
        self.assertRegex(run.out, TERMINATED)
        self.assertNoTemporaries()

    def test_with_a_log_that_nobody_reads(self):
        path = self.m.base / 'full'
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as unread, \
                socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as filler:
            unread.bind(str(path))
            filler.setblocking(False)
            try:
                while True:
                    filler.sendto(b'x', str(path))
            except BlockingIOError:
                pass
            for log in (path, None):
                self.assertRegex(self.terminate('lang', log=log)[0].out, TERMINATED)

    def test_with_an_output_that_nobody_reads(self):
        reader, writer = os.pipe()
        os.set_blocking(writer, False)
        self.m.stop_at('lang')
        run = self.m.start('--report', 'weekly', stdout=writer)
        self.m.stopped_pid()
        try:
            while True:
                os.write(writer, b'x' * 4096)
        except BlockingIOError:
            os.set_blocking(writer, True)
        run.signal(signal.SIGTERM)
        run.finish()
        os.close(reader)
        os.close(writer)
        self.assertEqual((run.status, len(run.log_lines)), (1, 1))


class ClosedOutput(ProductTest):
    def test_a_report_needs_no_output(self):
        make_files(self.m.share('photos'), {'a.jpg': 10})
        self.m.profile('weekly', report_list='share_list')
        reader, writer = os.pipe()
        os.close(reader)
        for name, redirection in (('closed', '>&- 2>&- <&-'), ('full', '>/dev/full'),
                                  ('broken', '')):
            with self.subTest(name):
                command = ['/bin/sh', '-c', f'exec "$@" {redirection}', 'sh', PROGRAM, '--report',
                           'weekly']
                run = Run(self.m, command, self.m.new_log(),
                          stdout=writer if name == 'broken' else subprocess.PIPE).finish()
                folder = self.assertSucceeded(run, 'weekly')
                self.assertEqual(len(page_rows(folder / 'report.html', 'vornShareListData')), 1)
        os.close(writer)


if __name__ == '__main__':
    unittest.main()
