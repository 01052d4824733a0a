"""The Debian package in a private view of this machine: installed, run by systemd, upgraded,
removed and purged by the real tools, with everything they write kept in memory."""
import ctypes
import os
import re
import shutil
import subprocess
import tempfile
import unittest
from pathlib import Path

from harness import BUILD, needs_root

CLONE_NEWNS = 0x20000
CGROUPS = [Path('/sys/fs/cgroup', name) for name in ('', 'systemd', 'unified')]
# Records of dpkg and caches, whatever is installed.
RECORDS = re.compile(r'/(var/lib/dpkg/(status|available|lock|triggers)|var/cache/|var/log/)')


def call(*command, **options):
    done = subprocess.run(list(map(str, command)), stdin=subprocess.DEVNULL, text=True,
                          stdout=subprocess.PIPE, stderr=subprocess.STDOUT, **options)
    assert done.returncode == 0, f'{command}: {done.returncode}\n{done.stdout}'
    return done.stdout


@needs_root
class Package(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        """Makes the package, and a later one whose shipped configuration has changed."""
        cls.folder = tempfile.TemporaryDirectory(prefix='vorn-', dir='/var/tmp')
        cls.addClassCleanup(cls.folder.cleanup)
        base = Path(cls.folder.name)
        call('cpack', '--config', BUILD / 'CPackConfig.cmake', '-B', base, cwd=base)
        cls.package, = base.glob('*.deb')
        cls.later, tree = base / 'later', base / 'tree'
        call('dpkg-deb', '--raw-extract', cls.package, tree)
        call('sed', '-i', 's/^Version:.*/&.1/', tree / 'DEBIAN/control')
        for path in tree.glob('usr/**/*.conf'):
            path.write_text(path.read_text() + '# changed\n')
        call('dpkg-deb', '--build', tree, cls.later)
        # All that is mounted from now on goes with this process.
        assert ctypes.CDLL(None, use_errno=True).unshare(CLONE_NEWNS) == 0
        call('mount', '--make-rprivate', '/')

    def setUp(self):
        self.base = Path(tempfile.mkdtemp(prefix='machine', dir=self.folder.name))
        call('mount', '-t', 'tmpfs', 'private', self.base)
        self.addCleanup(call, 'umount', '-R', self.base)
        self.written, self.root = self.base / 'written', self.base / 'root'
        for path in (self.written, self.root, self.base / 'work'):
            path.mkdir()
        call('mount', '-t', 'overlay', '-o',
             f'lowerdir=/,upperdir={self.written},workdir={self.base / "work"}', 'private', self.root)
        call('mount', '--bind', '/dev', self.root / 'dev')
        call('mount', '-t', 'proc', 'private', self.root / 'proc')

    def within(self, *command):
        return call('chroot', self.root, *command, env={
            'PATH': '/usr/sbin:/usr/bin:/sbin:/bin', 'DEBIAN_FRONTEND': 'noninteractive'})

    def dpkg(self, action, package='vornreport'):
        if action == '--install':
            shutil.copy(package, self.root / 'var/cache/package.deb')
            package = '/var/cache/package.deb'
        return self.within('dpkg', action, package)

    def tree(self, *folders):
        return {str(path): path.read_bytes()
                for folder in folders for path in (self.root / folder).rglob('*') if path.is_file()}

    def left(self):
        """What differs from the machine below, besides records."""
        found = []
        for folder, folders, files in os.walk(self.written):
            below = Path('/', os.path.relpath(folder, self.written))
            found += [str(below / name) for name in files]
            found += [str(below / name) for name in folders if not (below / name).exists()]
        return [path for path in found if not RECORDS.match(path)]

    def test_lintian(self):
        call('lintian', '--allow-root', '--fail-on', 'error', self.package)

    def test_life(self):
        self.dpkg('--install', self.package)
        self.assertEqual(self.within('readlink', '-e', '/usr/sbin/vornctl'),
                         '/usr/vorn/bin/vornctl\n')
        elsewhere = self.root / 'srv/elsewhere'
        (self.root / 'srv/share').mkdir(parents=True)
        (self.root / 'srv/share/file').write_bytes(b'x' * 5)
        with (self.root / 'usr/vorn/etc/share.conf').open('a') as file:
            file.write('[mine]\npath = /srv/share\n')
        with (self.root / 'usr/vorn/etc/vornreport.conf').open('a') as file:
            file.write('[own]\nreport_list = large_file\n'
                       '[other]\nreport_list = large_file\nreport_dir = /srv/elsewhere\n')
        for profile in ('own', 'other'):
            self.within('/usr/vorn/bin/vornreport', '--report', profile)
            status = self.root / 'usr/vorn/var/status' / profile
            self.assertEqual(status.read_text(), 'success\n')
        cron = self.root / 'etc/cron.d/vornreport-own'
        cron.parent.mkdir(exist_ok=True)
        cron.write_text('0 4 * * 1 root true\n')

        mine = ('usr/vorn/etc', 'usr/vorn/var', 'srv', 'etc/cron.d')
        before = self.tree(*mine)
        for action, package in (('--install', self.later), ('--remove', 'vornreport'),
                                ('--install', self.package), ('--remove', 'vornreport')):
            self.dpkg(action, package)
            self.assertEqual(self.tree(*mine), before, action)
        self.assertFalse((self.root / 'usr/vorn/bin').exists())

        reports = self.tree('srv')
        self.dpkg('--purge')
        self.assertEqual(self.tree('srv'), reports)
        self.assertTrue(list(elsewhere.glob('other/*/report.html')))
        shutil.rmtree(self.root / 'srv/share')
        shutil.rmtree(elsewhere)
        self.assertEqual(self.left(), [])


if __name__ == '__main__':
    unittest.main()
