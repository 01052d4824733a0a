"""The reports on files, on a tree with odd names, owners, ages, types and duplicates, to the byte."""
import os
import re
import signal

from expected import (DAY, MARK, SCRIPT, Tree, block, csv, csv_line, data_blocks, facts, local_time,
                      totals)
from harness import ProductTest, make_files, needs_root

ACCOUNTS = {'root': 0, 'ann': 3001, 'bob': 3002, 'john-doe': 3003, 'eve': 3004}
UNKNOWN = 3999
GROUP_HEADER = MARK + b'Group, Share, Size\n'
TIME_HEADER = 'Share\tFile\tSize(Byte)\tModify Time'
DUPLICATE_HEADER = 'Duplicate Group\t' + TIME_HEADER
OWNER_HEADER = 'Owner\tShare\tFile Count\tSize(Byte)'
LARGE_HEADER = 'Share\tFile\tSize(Byte)'
IMAGES = ('IMG_1.JPG', "it's.JPG", 'Übergröße.JPG')
# As names: 007 is 7, 1e3 is 1000, and digits beyond the fifteenth don't count.
NUMBERS = ('007', '7', '1000', '1e3', '12345678901234567890', '12345678901234567891')
LABELS = {'document': 'odt', 'spreadsheet': 'ods', 'presentation': 'odp', 'text': 'txt',
          'image': 'JPG', 'audio': 'flac', 'video': 'mkv', 'archive': 'zip', 'disk_image': 'iso',
          'database': 'sqlite', 'source': 'cpp', 'executable': 'exe', 'font': 'ttf', 'mail': 'eml',
          'backup': 'bak', 'web': 'html', 'drawing': 'dwg', 'other': 'unheard'}
ODD_NAMES = {"it's.jpg": 'image', 'say "hi".png': 'image', 'line\nbreak\tand tab.txt': 'text',
             'bytes\udcff\udcc3.bin': 'executable', '<script>alert(1)<': 'other',
             'gnp.\u202egpj.exe': 'executable', 'back\\slash\\n': 'other',
             '=1+1.flac': 'audio', '\u65e5\u672c a\u0308.mkv': 'video', '.hidden/.profile': 'other',
             'ends in a dot.': 'other', ' blank ': 'other', 'd/' * 300 + 'deep': 'other',
             'n' * 255: 'other', ('\x01' * 250 + '/') * 6 + 'too long once escaped': 'other'}


def fill(tree):
    add = tree.add
    for i, (name, label) in enumerate(ODD_NAMES.items()):
        add('Projekte & mehr', name, 1001 + i, label)
    for i, (label, ending) in enumerate(LABELS.items()):
        add('types', 'file.' + ending, 700 + i, label, 3003)
    for owner, name in enumerate(IMAGES):
        add('photos', name, 5000 + owner, 'image', 3001 + owner, 100 + owner)
        add('backup', 'copy of/' + name, 5000 + owner, 'image', 3001, 8)
    add('photos', 'one byte more/IMG_1.JPG', 5001, 'image', 3002, 100)
    add('photos', 'no type', 0, 'other', 3002)
    add('photos', 'nobody.txt', 77, 'text', UNKNOWN, 1)
    add('backup', 'nobody.txt', 78, 'text', UNKNOWN, 2)
    add('photos', 'big.mkv', (5 << 30) + 1, 'video', 0)
    share, path, *rest = tree.files[-1]
    tree.files.append((share, path.replace('big', 'second name'), *rest))
    os.link(path, tree.files[-1][1])
    hour = 1 / 24
    for i, days in enumerate((7 - hour, 7 + hour, 90 - hour, 90 + hour, 20000, 0, -2)):
        add('ages', f'{i}.odt', 100 + i, 'document', 3003, days)
    # Shares that an owner has equally many bytes in: the one with more files first.
    for name, size in (('ages/half1', 6), ('ages/half2', 6), ('backup/whole', 12)):
        add(*name.split('/'), size, 'other', 3004)
    for name in (*NUMBERS, '70', '007.odt', '7.odt'):
        add('photos', name, 3, 'document' if 'odt' in name else 'other', 3001)
    # More than the page holds of each list of files.
    for i in range(250):
        for half, days in (('a', 100), ('b', 1)):
            add('many', f'{half}/{i:03}.txt', 9, 'text', 3001, days)
    # What is no file of a share.
    photos = tree.folders['photos']
    make_files(photos, {'@eaDir/thumb.jpg': 10 ** 9, 'sub/@eaDir/deep/thumb.jpg': 10 ** 9})
    for name, target in (('link.jpg', path), ('folder link', tree.folders['ages']),
                         ('dangling', 'nowhere')):
        os.symlink(target, photos / name)
    os.mkfifo(photos / 'pipe')


class Reports(ProductTest):
    def setUp(self):
        super().setUp()
        self.m.accounts(ACCOUNTS)
        self.tree = Tree(self.m)

    def report(self, profile, log=(), err='', **keys):
        """Runs a report that logs exactly lines that match `log`; its folder."""
        if keys:
            self.m.profile(profile, **keys)
        self.done = self.m.run('--report', profile)
        self.assertEqual(len(self.done.log_lines), len(log), self.done.log_lines)
        for line, pattern in zip(self.done.log_lines, log):
            self.assertRegex(line, f'^{pattern}\\n+$')
        del self.done.log_lines[:]
        return self.assertSucceeded(self.done, profile, err)

    def assertHolds(self, folder, blocks, **csv_files):
        """A whole page with the blocks, the CSV files, the facts, and nothing else."""
        page = (folder / 'report.html').read_bytes()
        self.assertTrue(page.startswith(b'<!DOCTYPE html>\n') and page.endswith(b'\n</html>\n'))
        self.assertEqual(data_blocks(folder), blocks)
        self.assertEqual({path.stem: path.read_bytes() for path in folder.rglob('*.csv')},
                         csv_files)
        facts(folder)
        self.assertEqual(len(list(folder.rglob('*'))), 3 + len(csv_files))

    def owner_rows(self):
        names = {uid: name for name, uid in ACCOUNTS.items()}
        rows = [(owner, share, count, size) for (owner, share), (count, size) in totals(
            ((file[4], file[0]), file[2]) for file in self.tree.files).items()]
        rows.sort(key=lambda row: (row[0], -row[3], -row[2]))
        return [(names[row[0]], *row[1:]) for row in rows if row[0] in names]

    def group_block(self, *users):
        """The block when no more than 100 rows come together."""
        sections = []
        for user in ('vornAll', *users):
            rows = sorted(totals(((file[5], file[0]), file[2]) for file in self.tree.files
                                 if user == 'vornAll' or file[4] == ACCOUNTS[user]).items())
            rows = [f"[ '{label}', '{share}', {size} ]" for (label, share), (_, size) in rows]
            end = '' if user == 'vornAll' else '\n'
            sections.append(f'{user} : [\n' + ',\n'.join(rows) + end + ']\n')
        return SCRIPT + ('var vornFileGroupTableData = {\n' + ',\n'.join(sections) +
                         '\n}</script>\n').encode()

    def numbered(self, groups):
        """The rows of groups of files, which are named by share and path in it."""
        files = {f'{file[0]}/{os.path.relpath(file[1], self.tree.folders[file[0]])}': file[:4]
                 for file in self.tree.files}
        return [(number, *files[name]) for number, group in enumerate(groups, 1)
                for name in group]

    def in_order(self, folder, rows):
        """`rows` as they stand in the CSV file, whose order must be that of the sizes."""
        rows = {csv_line(row): row for row in rows}
        lines = (folder / 'csv/large_file.csv').read_bytes().split(b'\n')[1:-1]
        sizes = [rows[line][2] for line in lines]
        self.assertEqual((sizes, set(lines)), (sorted(sizes, reverse=True), set(rows)))
        return [rows[line] for line in lines]

    @needs_root
    def test_every_report_of_one_run(self):
        fill(self.tree)
        log = [r'src/rep_file_owner:\d+ .*get user name failed'] * 2 + [
            r'src/rep_file_group:\d+ .*user get failed, user=nobody-such']
        folder = self.report('all', log, limit_user='ann,,john-doe,nobody-such,eve', report_list=(
            'most_modify,least_modify,large_file,duplicate_file,file_group,share_list,file_owner'))
        files, now = self.tree.files, self.tree.now
        volume = re.search(r'"types"\t"(/[^"]*)"',
                           (folder / 'csv/share_list.csv').read_text())[1]
        shares = [(share, volume, size) for share, (_, size) in sorted(
            totals((file[0], file[2]) for file in files).items(), key=lambda item: -item[1][1])]
        owners = self.owner_rows()
        duplicates = self.numbered(
            [(f'backup/copy of/{name}', f'photos/{name}') for name in reversed(IMAGES)]
            + [(f'many/a/{i:03}.txt', f'many/b/{i:03}.txt') for i in range(250)]
            + [(f'photos/{NUMBERS[i]}', f'photos/{NUMBERS[i + 1]}') for i in (0, 2, 4)])
        large = self.in_order(folder, [file[:3] for file in files])
        by_time = sorted((file[:4] for file in files), key=lambda file: file[3])
        oldest = [file for file in by_time if file[3] < now - 90 * DAY]
        newest = [file for file in by_time[::-1] if file[3] > now - 7 * DAY]
        self.assertGreater(min(duplicates[-1][0], len(oldest), len(newest)), 200)

        def with_date(rows):
            return [(*row[:-1], local_time(row[-1])) for row in rows]
        expected = b''.join((
            block('vornFileOwnerData', owners), block('vornShareListData', shares),
            self.group_block('ann', 'john-doe', 'eve'), self.tree.share_paths(),
            block('vornDuplicateFileData', [row for row in duplicates if row[0] <= 200],
                  'var vornDuplicateHashMatch = 0;\n'),
            block('vornLargeFileData', large[:200]), block('vornLeastModifyData', oldest[:200]),
            block('vornMostModifyData', newest[:200])))
        csv_files = {'file_owner': csv(OWNER_HEADER, owners),
                     'share_list': csv('Share\tSize', shares), 'file_group': GROUP_HEADER,
                     'duplicate_file': csv(DUPLICATE_HEADER, with_date(duplicates)),
                     'large_file': csv(LARGE_HEADER, large),
                     'least_modify': csv(TIME_HEADER, with_date(oldest)),
                     'most_modify': csv(TIME_HEADER, with_date(newest))}
        self.assertHolds(folder, expected, **csv_files)
        self.assertEqual(sorted(os.listdir(self.m.reports / 'all/template')),
                         ['index.js', 'lang', 'report.css', 'report.js'])
        self.assertEqual(re.findall(r'\(src/file_gathering:\d+\)stat (.*)\n', self.done.out),
                         ['start', *(f'share={share}' for share in self.tree.folders), 'complete'])
        self.assertIn(f'(src/vornreport:134)get link=file://{folder}/report.html', self.done.out)

        # Runs of one second have names of their own, and a killed run leaves nothing to the next.
        again = self.report('all', log)
        self.assertEqual(self.m.report_folders('all'), [folder, again])
        self.assertHolds(again, expected, **csv_files)
        for stop in ('lang', 'body 2', 'tail'):
            with self.subTest(stop):
                self.m.stop_at(stop)
                run = self.m.start('--report', 'all')
                for pid in (self.m.stopped_pid(), run.pid()):
                    os.kill(pid, signal.SIGKILL)
                run.finish()
                self.m.go_on()
                self.assertNotEqual(self.m.leftovers(), [])
                self.assertHolds(self.report('all', log, '.* did not finish: it was killed.*\n'),
                                 expected, **csv_files)

    def test_selected_shares_and_reports(self):
        self.tree.folders['empty'] = self.m.share('empty')
        self.tree.add('photos', 'a.jpg', 10, 'image')
        self.tree.add('other', 'a.jpg', 10, 'image')
        row = self.tree.files[0][:3]
        self.assertHolds(
            self.report('some', report_list='large_file_db', share_list='empty, photos'),
            self.tree.share_paths() + block('vornLargeFileData', [row]),
            large_file=csv(LARGE_HEADER, [row]))
        reports = ('file_owner', 'share_list', 'file_group', 'duplicate_file', 'large_file')
        for mode, header in (('false', csv(DUPLICATE_HEADER, [])), ('true', b'')):
            with self.subTest(mode):
                folder = self.report('none' + mode, report_list=','.join(reports),
                                     share_list='empty', duplicate_compare=mode)
                self.assertHolds(
                    folder, b'</script>\n' * 2 + b'\n}</script>\n' + b'</script>\n' * 2,
                    file_owner=csv(OWNER_HEADER, []), share_list=csv('Share\tSize', []),
                    file_group=GROUP_HEADER, duplicate_file=header,
                    large_file=csv(LARGE_HEADER, []))

    def test_duplicates_by_content(self):
        add = self.tree.add
        large = os.urandom(10000)
        other_middle = large[:5000] + b'other' + large[5005:]
        for name, content in (('a', large), ('b', large), ('c', b'x' + large[1:]),
                              ('d', other_middle), ('e', large), ('f', b'x' + large[1:]),
                              ('g', large[:-1] + b'z'), ('single', large + b'.'),
                              ('h', other_middle)):
            add('docs', name, content)
        for i, content in enumerate((b'p' * 3000, b'q' * 3000, b'p' * 3000, b'p' * 2999 + b'q')):
            add('other', str(i), content)
        for i in range(4):
            add('docs' if i % 2 else 'other', f'empty{i}')
        for size in (4096, 4097, 8191, 8192):
            for half in 'ab':
                add('edge', f'{size}{half}', b'e' * size)
        for i in range(200):  # more groups than the page holds
            for half in 'ab':
                add('many', f'{i:03}{half}', b'%03d' % i)
        # Largest size first; in a group the last that was found first.
        groups = ['docs/e docs/b docs/a', 'docs/f docs/c', 'docs/h docs/d',
                  *(f'edge/{size}b edge/{size}a' for size in (8192, 8191, 4097, 4096)),
                  'other/2 other/0', *(f'many/{i:03}b many/{i:03}a' for i in range(200)),
                  'other/empty2 other/empty0 docs/empty3 docs/empty1']
        rows = self.numbered(map(str.split, groups))

        folder = self.report('p', report_list='duplicate_file', duplicate_compare='True')
        self.assertHolds(
            folder, self.tree.share_paths() + SCRIPT +
            b'var vornDuplicateHashMatch = 1;\nvar vornDuplicateFileData = [\n' + ',\n'.join(
                f"[ '{number}', '{share}', '{path}', {size}, {changed} ]"
                for number, share, path, size, changed in rows if number <= 200).encode() +
            b'\n];\n</script>\n',
            duplicate_file=MARK + DUPLICATE_HEADER.encode() + b'\n' + b''.join(
                f'{number}\t{share}\t{path}\t{size}\t{local_time(changed)}\n'.encode()
                for number, share, path, size, changed in rows))
        # Same sample, different content; how many files were grouped and read whole before.
        self.assertEqual(re.findall(r'^\(src/rep_duplicate_file:\d+\)##### match\((.*?)\), '
                                    r'not match file=\(.*/(.),.*/(.)\)$', self.done.out, re.M),
                         [('2/3', 'a', 'c'), ('3/5', 'a', 'f'), ('3/6', 'a', 'g'),
                          ('5/6', 'c', 'g')])
