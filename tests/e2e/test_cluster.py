"""A share on a cluster file system: a real volume of two bricks, compared with what lies on them."""
import os
import shutil
import subprocess
import unittest

from expected import Tree, csv, facts
from harness import LIMIT, PROGRAM, ProductTest, needs_root

# With files and processes of its own, for which nobody else's are seen. It refuses 127.0.0.1.
SERVE = '''
for folder in /run /var/lib/glusterd /var/log/glusterfs; do mount -t tmpfs private $folder; done
ip link set lo up; ip address add 10.99.0.1/32 dev lo
glusterd --no-daemon >/dev/null 2>&1 &
until gluster volume list >/dev/null 2>&1; do sleep 0.1; done
gluster --mode=script volume create v 10.99.0.1:"$1"/brick1 10.99.0.1:"$1"/brick2 force >&2
gluster --mode=script volume start v >&2
mount -t glusterfs 10.99.0.1:/v "$2"
cp -a "$1"/tree/. "$2"
shift 2
exec "$@"
'''


@needs_root
class Gluster(ProductTest):
    @unittest.skipUnless(shutil.which('glusterd') and os.path.exists('/dev/fuse'),
                         'GlusterFS is not tried here: it needs glusterfs-server, glusterfs-client '
                         'and /dev/fuse')
    def test_a_volume_of_two_bricks(self):
        share = self.m.share('cluster')
        bricks = [self.m.base / name for name in ('brick1', 'brick2')]
        tree = Tree(self.m)
        tree.folders['cluster'] = self.m.base / 'tree'
        for i in range(60):
            tree.add('cluster', f'{i % 7}/{"n" * (i * 4)}{i}', 1000 + i, days=i * 40)
        (self.m.base / 'tree/empty').mkdir()
        self.m.profile('p', report_list='large_file,folder_usage,coverage')
        done = subprocess.run(
            ['unshare', '--mount', '--net', '--pid', '--fork', '--kill-child', '--mount-proc', 'bash',
             '-ec', SERVE, 'bash', self.m.base, share, *self.m.sandbox(), '--', PROGRAM, '--report',
             'p'], text=True, capture_output=True, timeout=4 * LIMIT)
        self.assertEqual((done.returncode, self.m.status('p')), (0, 'success'), done.stdout + done.stderr)
        report, = self.m.report_folders('p')
        self.assertEqual(facts(report)['incidents'], [])

        # A folder is on both bricks; a file on one, and on the other at most as a pointer to it.
        files, folders = {}, {'.'}
        for brick in bricks:
            here = 0
            for path, below, names in os.walk(brick):
                below[:] = [name for name in below if name != '.glusterfs']
                folders |= {os.path.relpath(os.path.join(path, name), brick) for name in below}
                for name in names:
                    status = os.lstat(os.path.join(path, name))
                    if not status.st_mode & 0o1000:
                        files[os.path.relpath(os.path.join(path, name), brick)] = status
                        here += 1
            self.assertGreater(here, 0, 'all files are on one brick')
        self.assertEqual(len(files), 60)
        rows = sorted((('cluster', f'{share}/{name}', status.st_size)
                       for name, status in files.items()), key=lambda row: -row[2])
        self.assertEqual((report / 'csv/large_file.csv').read_bytes(),
                         csv('Share\tFile\tSize(Byte)', rows))
        told = [line.split('\t') for line in
                (report / 'csv/folder_usage.csv').read_text().splitlines()[1:]]
        self.assertEqual({row[1].strip('"'): (int(row[2].strip('"')), int(row[3].strip('"')))
                          for row in told}, {folder: self.amount(files, folder) for folder in folders})
        cover, = (report / 'csv/coverage.csv').read_text().splitlines()[1:]
        total, count = self.amount(files, '.')
        self.assertRegex(cover, f'^"{share}"\t"cluster"\t"{count}"\t"{total}"\t"\\d+"\t"0"\t"0"$')

    def amount(self, files, folder):
        sizes = [status.st_size for name, status in files.items()
                 if folder == '.' or name.startswith(folder + '/')]
        return sum(sizes), len(sizes)
