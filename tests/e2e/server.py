"""A file server as people have them: four volumes of hundreds of gigabytes (in sparse images),
shares on them, users with quotas, a year of history, duplicates, old files and odd names."""
import os
import random
import time

from harness import call, mount_image, private_mounts

GIB = 1 << 30
DAY = 86400
USERS = {'anna': 3001, 'bjoern': 3002, 'chen': 3003, 'dora': 3004, 'john-doe': 3005, 'eve': 3006}
QUOTAS = {'anna': 120, 'bjoern': 60, 'chen': 80, 'dora': 100, 'john-doe': 40}  # GiB
# Name to size in GiB, now in use, and bytes a day by which it grows of late.
VOLUMES = {'projects': (1024, .91, 4.5 * GIB), 'home': (512, .62, .9 * GIB),
           'media': (2048, .78, 6 * GIB), 'archive': (2048, .44, -.2 * GIB)}
SHARES = {'projects': ('Engineering', 'Marketing', 'Research', 'CAD'), 'home': ('Users',),
          'media': ('Photos', 'Videos', 'Podcasts'), 'archive': ('Backups', '2019-2023')}
FILES = {  # share to endings with the weight of each
    'Engineering': 'iso qcow2 zip cpp log db', 'Marketing': 'psd pptx mp4 pdf jpg',
    'Research': 'csv db tar ipynb pdf', 'CAD': 'dwg step stl pdf', 'Users': 'docx xlsx pdf jpg zip',
    'Photos': 'raw jpg tif', 'Videos': 'mov mkv mp4', 'Podcasts': 'wav mp3 flac',
    'Backups': 'bak dump vmdk tar', '2019-2023': 'zip pdf docx tar'}
WORDS = ('annual', 'budget', 'draft', 'final', 'release', 'survey', 'team', 'scan', 'build', 'night',
         'harbour', 'model', 'sensor', 'plan', 'minutes', 'offer', 'campaign', 'render', 'master')
ODD = ("</script><script>document.title='run'</script>", '<!--<script>', "'\"><img src=x onerror=x>",
       'back\\slash\\u0041', 'line\nbreak', 'gnp.\u202egpj.exe', 'zero\u200bwidth\u2028',
       'bytes\udcff\udcc3', 'tab\tand\x1b[31m', '&lt;b&gt;&amp;', '007', "it's 100 %")


class Server:
    """Fills `machine`, whose /srv it becomes. Needs root; `test` unmounts the volumes again."""

    def __init__(self, machine, test, now=None):
        self.machine, self.test = machine, test
        self.choice = random.Random(7)
        self.now = int(now or time.time())
        private_mounts()
        self.root = machine.base / 'srv'
        machine.accounts({'root': 0} | USERS)
        machine.options += ['--bind', self.root, '/srv']
        for name, (size, used, _) in VOLUMES.items():
            self.mount(name, size)
            self.fill(name, size * used)
        self.quotas()

    def mount(self, name, size):
        quota = ',usrquota' if name == 'home' else ''
        device = mount_image(self.test, self.root / name, size * GIB, '-m', '0', '-O',
                             '^quota,^has_journal,^resize_inode', '-T', 'largefile4', '-E',
                             'lazy_itable_init=1,nodiscard', options=f'loop,noinit_itable{quota}')
        self.machine.options += ['--bind', device, device]

    def fill(self, volume, gib):
        """Files that take up `gib` in all, most of it in a few, as it is everywhere."""
        for i, share in enumerate(SHARES[volume]):
            part = gib * (.5, .26, .16, .08)[i] / sum((.5, .26, .16, .08)[:len(SHARES[volume])])
            folder = self.root / volume / share
            self.machine.share(share, f'/srv/{volume}/{share}', inside=True)
            for n in range(70):
                # Sizes that halve every eight files sum up to some eleven times the first.
                self.add(folder, self.name(share), int(part * GIB * .083 * .5 ** (n / 8)),
                         self.choice.choice(list(USERS.values())), self.choice.lognormvariate(5, 1.3))
        if volume == 'projects':
            for name in ODD:
                self.add(self.root / volume / 'Engineering' / 'from outside', name, 1 << 22, 3006, 3)
        if volume == 'media':
            for i in range(24):
                for copy in ('2024/', 'to sort/', 'old phone/')[:2 + i % 2]:
                    self.add(self.root / volume / 'Photos', f'{copy}DSC_{4100 + i}.NEF',
                             (38 << 20) + i * 70001, 3003, 200 + i)

    def name(self, share):
        words = self.choice.sample(WORDS, 3)
        return (f'{words[0]} {self.choice.randrange(2019, 2027)}/{words[1]}-{words[2]}-'
                f'{self.choice.randrange(100)}.{self.choice.choice(FILES[share].split())}')

    def add(self, folder, name, size, owner, days):
        path = os.fsencode(folder) + b'/' + os.fsencode(name)
        os.makedirs(os.path.dirname(path), exist_ok=True)
        with open(path, 'wb') as file:
            if size:
                os.posix_fallocate(file.fileno(), 0, size)
        os.chown(path, owner, -1)
        os.utime(path, (self.now - days * DAY,) * 2)

    def quotas(self):
        # So much of each quota is used: over, near, well below.
        for (user, gib), share in zip(QUOTAS.items(), (1.08, .94, .4, .72, .12)):
            folder = self.root / 'home/Users' / user
            uid = USERS[user]
            used = sum(os.stat(path).st_blocks * 512 for path in self.root.glob('home/**/*')
                       if path.is_file() and path.stat().st_uid == uid)
            quota = used / GIB / share
            self.add(folder, 'mail.mbox', 1 << 20, uid, 1)
            QUOTAS[user] = quota
        call('sync', '-f', self.root / 'home')
        call('quotacheck', '-cum', self.root / 'home')
        for user, gib in QUOTAS.items():
            soft = int(gib * (1 << 20))
            call('setquota', '-u', USERS[user], soft, soft * 2, 0, 0, self.root / 'home')

    def history(self, days=360):
        """Samples of every third day, and gaps where the server was off."""
        rows = []
        for name, (size, used, growth) in VOLUMES.items():
            walk = 0
            for day in range(3, days, 3):
                if 120 < day < 150:
                    continue
                walk += self.choice.uniform(-.004, .004) * size * GIB
                # It has grown faster of late.
                grown = growth * (min(day, 60) + max(0, day - 60) / 4)
                use = int(size * GIB * used - grown + (walk if day > 20 else 0))
                rows.append(('global', f'/srv/{name}', use, size * GIB - use,
                             f'{use * 100 / size / GIB:f}'[:7], self.now - day * DAY))
        # A volume that is no longer there.
        rows.append(('global', '/srv/retired', 1, 1, '50.0000', self.now - 9 * DAY))
        self.machine.samples(rows)
