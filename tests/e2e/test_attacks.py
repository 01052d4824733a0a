"""What others put in the way of a run, and what a machine refuses it: the run is what it would have
been, or it is told."""
import os
import signal
from pathlib import Path

from expected import data_blocks, facts
from harness import ALL, PROGRAM, ROOT, ProductTest, Run, make_files, needs_root, wait_for


@needs_root
class HungMounts(ProductTest):
    """A mount whose daemon never answers. (One that hangs in a walk is the walk's own test.)"""

    def start_on_hung_mount(self):
        try:
            fuse = os.open('/dev/fuse', os.O_RDWR)
        except OSError as error:
            self.skipTest(f'no file system can be made to hang here (/dev/fuse: {error.strerror}); '
                          'run modprobe fuse, and let a container have /dev/fuse')
        make_files(self.m.share('photos'), {'a.jpg': 10})
        hung = self.m.share('hung')
        self.m.profile('weekly', report_list='share_list')
        # Only the daemon may have the device: the mount ends with the last one who has.
        run = Run(self.m, ['/bin/bash', '-c', f'''
            {ROOT}/tests/e2e/hung_mount.py {fuse} {hung} >/tmp/mounted 2>&1 & echo $! >/tmp/daemon
            until [ -s /tmp/mounted ]; do sleep 0.01; done
            exec {PROGRAM} --report weekly {fuse}>&-'''], self.m.new_log(), pass_fds=[fuse])
        os.close(fuse)
        program = run.pid()
        self.addCleanup(lambda: os.kill(int((self.m.tmp / 'daemon').read_text()), signal.SIGKILL))
        return run, program, str(hung)

    def test_the_report_tells_what_hangs(self):
        run, _, hung = self.start_on_hung_mount()
        self.assertEqual((run.finish().status, self.m.status('weekly')), (0, 'success'), run.log_lines)
        told = facts(self.m.report_folders('weekly')[0])
        self.assertEqual({(each['kind'], each['what']) for each in told['incidents']},
                         {('share_missing', 'hung'), ('volume_unknown', hung)})

    def test_sigterm_ends_the_wait(self):
        run, program, _ = self.start_on_hung_mount()
        looks = Path(f'/proc/{program}/task/{program}/children')
        daemon = (self.m.tmp / 'daemon').read_text().split()
        wait_for(lambda: looks.read_text().split() != daemon, 'the first look')
        os.kill(program, signal.SIGTERM)
        self.assertEqual(run.finish().status, 1)
        self.assertEqual((run.out.count('SIGTERM'), self.m.leftovers()), (1, []))
        self.assertFalse((self.m.vorn / 'var/status/weekly').exists())


class Refusals(ProductTest):
    def test_every_amount_of_memory(self):
        make_files(self.m.share('photos'), {f'{i % 100}/{i}.jpg': 10 for i in range(20_000)})
        self.m.profile('weekly', report_list=ALL, duplicate_compare='true')
        seen = set()
        for room in [*range(26_000, 42_000, 500), 'unlimited']:
            with self.subTest(room=room):
                status = self.m.vorn / 'var/status/weekly'
                status.unlink(missing_ok=True)
                run = self.m.shell(f'ulimit -v {room}; exec {PROGRAM} --report weekly')
                word = status.read_text().split()[0] if status.exists() else 'not loaded'
                self.assertEqual(self.m.leftovers(), [])
                if run.status == 127 or 'GnuTLS' in run.err or 'before the run began' in run.err:
                    continue  # a library can't be loaded or ends the program, or there is no start
                self.assertEqual((run.status, run.err.count('terminate')), (0, 0))
                self.assertTrue(word == 'success' or run.log_lines)
                seen.add('out of memory, the run ends' in ''.join(run.log_lines) or word)
        self.assertLessEqual({True, 'success'}, seen)

    def test_a_page_whose_part_nobody_wrote(self):
        make_files(self.m.share('photos'), {'a.jpg': 10})
        self.m.profile('weekly', report_list='share_list,large_file')
        script = self.m.vorn / 'vornreport/reportUI/build-template.sh'
        original = script.rename(script.with_name('original.sh'))
        for call in ('header 2', 'lang 3', 'body 2', 'header 3', 'body 3', 'tail 2'):
            for fault in ('kill -9 $$', 'exit 0'):
                with self.subTest(call=call, fault=fault):
                    script.write_text(f'#!/bin/sh\n[ "$1 $#" != "{call}" ] || {fault}\n'
                                      f'exec "${{0%/*}}/{original.name}" "$@"\n')
                    script.chmod(0o755)
                    run = self.m.run('--report', 'weekly')
                    self.assertEqual((run.status, self.m.status('weekly')), (0, 'fail'))
                    self.assertEqual((self.m.report_folders('weekly'), self.m.leftovers()), ([], []))
                    self.assertRegex('\n'.join(run.log_lines),
                                     'create template failed|page .* is missing or lacks a part')

    def test_each_call_that_once_changed_a_page_silently(self):
        """With one system call failed by strace, the blocks stay or the run tells. Threads look
        ahead, so a share's folder, not a count, tells whose call it is."""
        photos, music = self.m.share('photos'), self.m.share('music')
        for share in (photos, music):
            make_files(share, {'a/same.jpg': 5000, 'b/other.mp3': 5000, 'x.txt': 7})
        for name, reports in (('files', 'share_list,file_owner,large_file,duplicate_file'),
                              ('quotas', 'quota_usage')):
            self.m.profile(name, report_list=reports, duplicate_compare='true')
        tool = self.m.base / 'repquota'
        tool.write_text('#!/bin/sh\nprintf "***\\nUser used\\n---\\nroot -- 20 0 0 2 0 0\\n"\n')
        tool.chmod(0o755)
        self.m.options += ['--bind', tool, os.path.realpath('/sbin/repquota')]

        def outcome(profile, *options):
            """The blocks with the facts of shares, and whether they are vouched for."""
            run = self.m.start('--report', profile) if not options else Run(self.m, [
                'strace', '-f', '-qq', '-o', '/dev/null', *options, PROGRAM, '--report', profile],
                self.m.new_log())
            run.finish()
            folders = self.m.report_folders(profile)
            status = self.m.vorn / 'var/status' / profile
            if not status.exists() or self.m.status(profile) != 'success':
                self.assertEqual((folders, bool(run.log_lines)), ([], True))
                return None, False
            told = facts(folders[0])
            # What earlier runs have left differs from run to run.
            shares = [{key: value for key, value in share.items() if key not in ('samples', 'grown')}
                      for share in told['shares'] or []]
            blocks = data_blocks(folders[0]), shares
            is_whole = told['incidents'] == []
            self.m.shell(f"rm -r '{folders[0]}'")
            return blocks, is_whole
        right = {profile: outcome(profile) for profile in ('files', 'quotas')}
        self.assertEqual([is_whole for _, is_whole in right.values()], [True, True])
        for name, profile, path, injected in (
                ('volume', 'files', photos, 'statfs:error=EIO'),
                ('volume of a share', 'files', photos, 'statx:error=ENOMEM'),
                ('mount table', 'files', '/proc/self/mountinfo', 'openat:error=EMFILE'),
                ('mount table, read', 'files', '/proc/self/mountinfo', 'read:error=EIO:when=2'),
                ('accounts', 'files', '/etc/passwd', 'openat:error=EMFILE'),
                ('accounts, read', 'files', '/etc/passwd', 'read:error=EIO'),
                ('accounts, rewound', 'files', '/etc/passwd', 'lseek:error=EIO'),
                ('folder', 'files', photos / 'a', 'openat:error=EIO'),
                ('listing', 'files', photos, 'getdents64:error=EIO:when=1'),
                ('end of a listing', 'files', photos, 'getdents64:error=EIO:when=2'),
                ('look at a file', 'files', photos, 'newfstatat:error=EIO:when=1'),
                ('sample', 'files', photos / 'a/same.jpg', 'pread64:error=EIO'),
                ('end of CSV files', 'files', None, 'fsync:error=EIO'),
                ('quota tool', 'quotas', None, 'clone3:error=EAGAIN:when=3')):
            with self.subTest(name):
                options = ['-P', path] if path else []
                blocks, is_whole = outcome(profile, *map(str, options), '-e', f'inject={injected}')
                self.assertTrue(not is_whole or blocks == right[profile][0])
