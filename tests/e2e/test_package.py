"""The Debian package in a private view of this machine: installed, run by systemd, upgraded,
removed and purged by the real tools, with everything they write kept in memory."""
import json
import os
import re
import shutil
import stat
import tempfile
import unittest
from pathlib import Path

from expected import data_rows
from harness import (BUILD, LIMIT, ROOT, MailServer, call, mount_image, needs_loop_devices,
                     needs_root, private_mounts)

CGROUPS = [Path('/sys/fs/cgroup', name) for name in ('', 'systemd', 'unified')]
# The package's own folders, and where the tests put what is theirs.
PLACES = ('usr/vorn', 'usr/share/vornreport', 'usr/share/doc/vornreport', 'srv', 'home/share',
          'etc/cron.d/vornreport-own', 'vornreport_0.1.0_amd64.deb')
# Records of dpkg and caches, whatever is installed.
RECORDS = re.compile(r'/(var/lib/dpkg/(status|available|lock|triggers)|var/cache/|var/log/)')
ENVIRONMENT = {'PATH': '/usr/sbin:/usr/bin:/sbin:/bin', 'DEBIAN_FRONTEND': 'noninteractive'}
PROFILE = 'duplicate_compare = true\nreport_list = duplicate_file,quota_usage,volume_usage\n'


@needs_root
class Package(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        """Makes the package, and a later one whose shipped configuration has changed."""
        folder = tempfile.TemporaryDirectory(prefix='vorn-', dir='/var/tmp')
        cls.addClassCleanup(folder.cleanup)
        cls.folder = Path(folder.name)
        call('cpack', '--config', BUILD / 'CPackConfig.cmake', '-B', cls.folder, umask=0o077)
        cls.package, = cls.folder.glob('*.deb')
        cls.later, tree = cls.folder / 'later', cls.folder / 'tree'
        call('dpkg-deb', '--raw-extract', cls.package, tree)
        call('sed', '-i', 's/^Version:.*/&.1/', tree / 'DEBIAN/control')
        call('sed', '-i', '$a # changed', *tree.glob('usr/**/*.conf'))
        call('dpkg-deb', '--build', tree, cls.later)
        private_mounts()
        call('mount', '-t', 'tmpfs', 'private', '/run')  # systemd-nspawn notes there what it runs

    def setUp(self):
        self.base = Path(tempfile.mkdtemp(dir=self.folder))
        call('mount', '-t', 'tmpfs', 'private', self.base)
        self.addCleanup(call, 'umount', '-R', self.base)
        self.written, self.root, work = (self.base / name for name in ('written', 'root', 'work'))
        for path in (self.written, self.root, work):
            path.mkdir()
        call('mount', '-t', 'overlay', '-o',
             f'lowerdir={self.cover()}:/,upperdir={self.written},workdir={work}', 'private', self.root)

    def cover(self):
        """A layer above this machine that hides the product, if it is here already, and whatever
        stands where the tests put what is theirs."""
        cover, records = self.base / 'cover', Path('/var/lib/dpkg')

        def covering(path):
            for folder in reversed(path.parents):
                (cover / folder.relative_to('/')).mkdir(exist_ok=True)
                shutil.copystat(folder, cover / folder.relative_to('/'))
            return cover / path.relative_to('/')
        listed = call('sh', '-c', f'dpkg-deb --fsys-tarfile {self.package} | tar -t')
        files = re.findall(r'^\./(.*[^/])$', listed, re.MULTILINE)
        hidden = [Path('/', name) for name in (*PLACES, *files) if name in PLACES or
                  not name.startswith(PLACES)] + list((records / 'info').glob('vornreport.*'))
        for path in filter(os.path.lexists, hidden):
            os.mknod(covering(path), stat.S_IFCHR)  # such a device hides the name below it
        others = re.sub(r'^Package: vornreport\n(.+\n)*\n?', '', (records / 'status').read_text(),
                        flags=re.MULTILINE)
        covering(records / 'status').write_text(others)
        return cover

    def dpkg(self, action, package):
        """As an administrator, or a script, that answers no question."""
        if package != 'vornreport':
            shutil.copy(package, self.root / 'var/cache/package.deb')
            package = '/var/cache/package.deb'
        call('mount', '--bind', '/dev', self.root / 'dev')
        call('chroot', self.root, 'dpkg', action, package, env=ENVIRONMENT)
        call('umount', self.root / 'dev')

    def configure(self, name, text):
        path = self.root / 'usr/vorn/etc' / name
        path.write_text(path.read_text() + text)

    def contents(self, *folders):
        return {str(path): path.read_bytes() for folder in folders
                for path in (self.root / folder).rglob('*') if path.is_file()}

    def left(self):
        """What differs from the machine below, besides records."""
        found = []
        for folder, folders, files in os.walk(self.written):
            below = Path('/', os.path.relpath(folder, self.written))
            found += [str(below / name) for name in files]
            found += [str(below / name) for name in folders if not (below / name).exists()]
        return [path for path in found if not RECORDS.match(path)]

    def boot(self, options, script):
        """Starts systemd on the machine, in control groups of its own, and runs a script under it.
        What that printed."""
        (self.root / 'script').write_text(script)
        units = self.root / 'etc/systemd/system'
        (units / 'script.service').write_text(
            '[Unit]\nSuccessAction=exit-force\nFailureAction=exit-force\n[Service]\nType=oneshot\n'
            'ExecStart=/bin/sh -ec ". /script 2>&1"\nStandardOutput=file:/out\n')
        for unit in ('network-online.target', 'timers.target'):
            (units / unit).symlink_to('/dev/null')  # nothing of this machine shall start
        groups = [path / f'vorn-{os.getpid()}' for path in CGROUPS
                  if (path / 'cgroup.procs').exists()]

        def enter():
            for group in groups:
                (group / 'cgroup.procs').write_text(str(os.getpid()))
        try:
            for group in groups:
                group.mkdir()
            call('systemd-nspawn', '--quiet', '--directory', self.root, '--register=no',
                 '--keep-unit', '--link-journal=no', '--resolv-conf=off', '--timezone=off',
                 '--machine', f'vorn-{os.getpid()}', *options, '--boot', '--',
                 '--unit=script.service', preexec_fn=enter, timeout=2 * LIMIT)
        except AssertionError as error:
            raise AssertionError(f'{error}\n{(self.root / "out").read_text()}') from None
        finally:
            for group in groups:
                for path, _, _ in os.walk(group, topdown=False):
                    os.rmdir(path)
        return (self.root / 'out').read_text()

    def quota_volume(self):
        """A volume with a quota for the user nobody; the options that make it /mnt."""
        volume = self.base / 'volume'
        device = mount_image(self, volume, 16 << 20, '-O', '^quota', options='loop,usrquota')
        (volume / 'file').write_bytes(b'x' * (8 << 10))
        shutil.chown(volume / 'file', 'nobody')
        call('sync', '-f', volume)
        call('quotacheck', '-cum', volume)
        call('setquota', '-u', 'nobody', 16, 32, 0, 0, volume)
        return [f'--bind={volume}:/mnt', f'--bind={device}']

    def test_lintian(self):
        call('lintian', '--allow-root', '--fail-on', 'error,warning', self.package)

    def test_life(self):
        """Nothing of an administrator is lost before the purge, and nothing is left after it."""
        self.dpkg('--install', self.package)
        share, elsewhere = self.root / 'srv/share', self.root / 'srv/elsewhere'
        share.mkdir(parents=True)
        (share / 'file').write_bytes(b'x')
        self.configure('share.conf', '[mine]\npath = /srv/share\n')
        self.configure('vornreport.conf', '[own]\nreport_list = large_file\n'
                       '[other]\nreport_list = large_file\nreport_dir = /srv/elsewhere\n')
        for profile in ('own', 'other'):
            call('chroot', self.root, '/usr/vorn/bin/vornreport', '--report', profile)
            status = self.root / 'usr/vorn/var/status' / profile
            self.assertEqual(status.read_text().splitlines()[0], 'success')
        call('chroot', self.root, 'vornctl', 'schedule', 'own', '--report', '@daily',
             env=ENVIRONMENT)
        mine = ('usr/vorn/etc', 'usr/vorn/var', 'srv', 'etc/cron.d')
        before = self.contents(*mine)
        self.assertIn(str(self.root / 'etc/cron.d/vornreport-own'), before)
        for action, package in (('--install', self.later), ('--remove', 'vornreport'),
                                ('--install', self.package), ('--remove', 'vornreport')):
            self.dpkg(action, package)
            self.assertEqual(self.contents(*mine), before, action)
        self.assertFalse((self.root / 'usr/vorn/bin').exists())
        reports = self.contents('srv')
        self.dpkg('--purge', 'vornreport')
        self.assertEqual(self.contents('srv'), reports)
        for path in (share, elsewhere):
            shutil.rmtree(path)
        self.assertEqual(self.left(), [])

    def test_readme(self):
        """README's everyday commands do what it shows, up to dates, numbers and blanks."""
        def normal(text):
            return re.sub(r'[0-9.]+', '0', re.sub(' +', ' ', text))
        for name in ('photos', 'projects'):
            share = self.root / 'srv' / name
            share.mkdir(parents=True)
            (share / 'file').write_bytes(b'x' * 1000)
        shutil.copy(self.package, self.root / 'vornreport_0.1.0_amd64.deb')
        for name in ('proc', 'dev'):
            call('mount', '--rbind', f'/{name}', self.root / name)
        text = (ROOT / 'README.md').read_text().split('## Every day\n')[1].split('\n## ')[0]
        transcript = ''.join(re.findall('^    (.*\n)', text, re.MULTILINE))
        steps = re.findall('^# (.*)\n((?:[^#].*\n)*)', transcript, re.MULTILINE)
        self.assertEqual([command.split()[0] for command, _ in steps],
                         ['apt-get'] + 8 * ['vornctl'] + ['apt-get'])
        for command, shown in steps:
            output = call('chroot', self.root, 'sh', '-c', f'cd /; {command}', env=ENVIRONMENT)
            if not command.startswith('apt-get'):
                self.assertEqual(normal(output), normal(shown), command)
        self.assertFalse((self.root / 'usr/vorn').exists())

    @needs_loop_devices
    def test_units(self):
        """The units forbid nothing that a run needs, and leave with the package."""
        self.dpkg('--install', self.package)
        units = list((self.root / 'usr/lib/systemd/system').glob('vornreport*.service'))
        for unit in units:
            call('systemd-analyze', 'security', '--offline=true', '--threshold=25', unit)
        share, elsewhere = self.root / 'home/share', self.root / 'elsewhere'
        for path in (share, elsewhere):
            path.mkdir(parents=True)
        for path in (share / 'first', share / 'second', share):
            if path != share:
                path.write_bytes(b'secret')
            path.chmod(0o700)
            shutil.chown(path, 'nobody')
        shutil.chown(elsewhere, group='users')
        elsewhere.chmod(0o2750)
        self.configure('share.conf', '[mine]\npath = /home/share\n')
        mails = MailServer(self, self.base / 'mails')
        mail = f'mail_to = ann@localhost\nsmtp_url = smtp://localhost:{mails.port}\n'
        metrics = self.root / 'srv/metrics'
        metrics.mkdir(parents=True)
        shutil.chown(self.root / 'srv', 'nobody')
        self.configure('vornreport.conf', (
            f'[home]\n{PROFILE}{mail}[denied]\n{PROFILE}{mail}report_dir = /mnt/denied\n'
            f'[elsewhere]\n{PROFILE}report_dir = /elsewhere\n'
            'metrics_file = /srv/metrics/elsewhere.prom\n'))
        (self.root / 'usr/sbin/policy-rc.d').unlink(missing_ok=True)  # a container's, that starts nothing
        own = self.root / 'etc/systemd/system/vornreport@elsewhere.service.d/own.conf'
        own.parent.mkdir()
        own.write_text('[Service]\nNice=11\n')
        doctor, told, listed, timers, log, remaining = self.boot(self.quota_volume(), """
systemctl --quiet enable --now vornreport@denied.timer vornreport-data@global.timer
systemctl --quiet enable vornreport@home.timer
vornctl doctor | grep '@' || true
echo ---
cd /etc/systemd/system
for unit in vornreport@home.timer vornreport@denied.timer; do
  mkdir $unit.d
  printf '[Timer]\nOnCalendar=*:*:0/3\nRandomizedDelaySec=0\nAccuracySec=1ms\n' >$unit.d/soon.conf
done
systemctl daemon-reload
systemctl restart vornreport@home.timer vornreport@denied.timer
for profile in home denied; do
  until grep -qs ended /usr/vorn/var/status/$profile; do sleep 0.1; done
done
systemctl stop vornreport@home.timer
rm -r vornreport@home.timer.d vornreport@denied.timer.d
systemctl daemon-reload
systemctl restart vornreport@denied.timer
vornctl status
vornctl log denied
vornctl schedule elsewhere --report '15 4 * * 2' >/dev/null
vornctl schedule elsewhere --timer --data @hourly >/dev/null
vornctl schedule home --report '@daily' >/dev/null
systemctl start vornreport-data@global vornreport@home vornreport@elsewhere
if systemctl start vornreport@denied >/dev/null 2>&1; then exit 1; fi
/usr/vorn/bin/vornreport --clean elsewhere >/dev/null
echo ---
vornctl schedule --json
echo ---
dpkg --remove vornreport >/dev/null
systemctl list-timers --no-legend
dpkg --install /var/cache/package.deb >/dev/null
systemctl list-timers --no-legend
vornctl profile remove denied >/dev/null 2>&1
vornctl schedule global --clean >/dev/null
sed -i 's/^.elsewhere]/[moved]/' /usr/vorn/etc/vornreport.conf
vornctl schedule elsewhere --clean >/dev/null
systemctl list-timers --no-legend
echo ---
journalctl -o cat -b -t vornreport
cp -r /usr/vorn/var/reports/home /kept
dpkg --purge vornreport >/dev/null
echo ---
systemctl list-timers --no-legend
""").split('---\n')
        self.assertRegex(doctor, r'(?m)^✗.*@home\.timer: it is enabled but not started')
        self.assertRegex(doctor, r'(?m)^✗.*@denied\.service: /mnt/denied can.t be found')
        self.assertRegex(told, r'(?m)^home +success (.*\n)*denied +fail (.*\n)+denied: the last run failed; ')
        said = re.findall(r'^20\d\d-.* vornreport\[\d+\]: (.*)', told, re.MULTILINE)
        self.assertTrue(said and '/mnt/denied' in said[0], told)
        self.assertEqual([line for line in said if line.startswith('vornreport: ')], [])
        self.assertEqual({(job['profile'], job['kind'], job['times'], job['next_run'] is not None)
                          for job in json.loads(listed)},
                         {('global', 'data', '0 3 * * *', True), ('home', 'report', '@daily', True),
                          ('denied', 'report', '0 4 * * 1', True),
                          ('elsewhere', 'report', '15 4 * * 2', True),
                          ('elsewhere', 'data', '@hourly', True)})
        names = ['vornreport-data@elsewhere', 'vornreport-data@global', 'vornreport@denied',
                 'vornreport@elsewhere', 'vornreport@home']
        found = re.findall(r' (vornreport\S+)\.timer', timers)
        self.assertEqual(sorted(found), sorted(names + ['vornreport@home']), timers)
        self.assertEqual(remaining, '')
        for line in log.splitlines():
            self.assertRegex(line, 'denied|"elsewhere" is still run by .*@elsewhere.timer; ')
        metrics = (metrics / 'elsewhere.prom').read_text()
        self.assertIn('last_run_success{profile="elsewhere"} 1\n', metrics)
        *_, page = self.root.glob('kept/[0-9]*/report.html')
        text = page.read_text()
        for expected in ("['nobody', 16384, 8192, 50.0]", "'/home/share/first', 6", "[ '/mnt', "):
            self.assertIn(expected, text)
        self.assertEqual(len(data_rows(text, 'vornVolumeUsageData')), 2, text[:1000])
        self.assertEqual({re.sub(r' of \S+', '', mail['Subject'].split(',')[0]) for mail in mails.mails()},
                         {'Storage report home', 'Storage report denied failed'})
        page, = elsewhere.glob('elsewhere/[0-9]*/report.html')
        for path in (page, page.with_name('report.json')):
            self.assertEqual((path.owner(), path.group(), path.stat().st_mode & 0o777),
                             ('root', 'users', 0o640), path)
        self.assertEqual({path for path in self.left() if 'vorn' in path},
                         {'/' + str(path.relative_to(self.root)) for path in (own, own.parent)})


if __name__ == '__main__':
    unittest.main()
