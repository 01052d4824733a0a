"""The reports on files, on a tree with owners, ages, types and duplicates, to the byte."""
import os
import re
import unittest
from pathlib import Path

from expected import (DAY, MARK, SCRIPT, Tree, block, csv, data_blocks, local_time, needs_root,
                      totals)
from harness import ProductTest, page_rows

ACCOUNTS = {'root': 0, 'ann': 3001, 'bob': 3002, 'john-doe': 3003, 'eve': 3004}
UNKNOWN = 3999
GROUP_HEADER = MARK + b'Group, Share, Size\n'
DUPLICATE_HEADER = 'Duplicate Group\tShare\tFile\tSize(Byte)\tModify Time'
LABELS = {'document': 'odt', 'spreadsheet': 'ods', 'presentation': 'odp', 'text': 'txt',
          'image': 'JPG', 'audio': 'flac', 'video': 'mkv', 'archive': 'zip', 'disk_image': 'iso',
          'database': 'sqlite', 'source': 'cpp', 'executable': 'exe', 'font': 'ttf', 'mail': 'eml',
          'backup': 'bak', 'web': 'html', 'drawing': 'dwg', 'other': 'unheard'}


class ReportTest(ProductTest):
    def setUp(self):
        super().setUp()
        passwd, group = self.m.base / 'passwd', self.m.base / 'group'
        passwd.write_text(''.join(f'{name}:x:{uid}:0::/:/bin/sh\n'
                                  for name, uid in ACCOUNTS.items()))
        group.write_text('root:x:0:\n')
        self.m.options += ['--bind', passwd, '/etc/passwd', '--bind', group, '/etc/group']
        self.shipped = self.m.config.read_text()
        self.tree = Tree(self.m)

    def report(self, log=(), **keys):
        """Runs a report that logs exactly lines that match `log`; its folder."""
        self.m.config.write_text(self.shipped)
        self.m.profile('all', **keys)
        self.run_done = self.m.run('--report', 'all')
        for line, pattern in zip(self.run_done.log_lines, log):
            self.assertRegex(line, f'^{pattern}\\n+$')
        self.assertEqual(len(self.run_done.log_lines), len(log), self.run_done.log_lines)
        del self.run_done.log_lines[:]
        return self.assertSucceeded(self.run_done, 'all')

    def csv(self, folder, name):
        return (folder / f'csv/{name}.csv').read_bytes()

    def owner_rows(self):
        names = {uid: name for name, uid in ACCOUNTS.items()}
        rows = [(owner, share, count, size) for (owner, share), (count, size) in totals(
            ((file[4], file[0]), file[2]) for file in self.tree.files).items()]
        rows.sort(key=lambda row: (row[0], -row[3], -row[2]))
        return [(names[row[0]], *row[1:]) for row in rows if row[0] in names]

    def group_block(self, *users):
        """(the block, its number of rows) when no more than 100 rows come together."""
        sections = []
        for user in ('vornAll', *users):
            rows = sorted(totals(((file[5], file[0]), file[2]) for file in self.tree.files
                                 if user == 'vornAll' or file[4] == ACCOUNTS[user]).items())
            rows = [f"[ '{label}', '{share}', {size} ]" for (label, share), (_, size) in rows]
            if rows:
                sections.append((user, rows))
        written = [user + ' : [\n' + ',\n'.join(rows) + ('' if user == 'vornAll' else '\n') + ']\n'
                   for user, rows in sections]
        return SCRIPT + ('var vornFileGroupTableData = {\n' + ',\n'.join(written) +
                         '\n}</script>\n').encode()

    def duplicates(self):
        """Rows by name and size: the number of the group, and the file."""
        def same(file):
            name = os.path.basename(file[1])
            # A bare number of any notation is stored as that number.
            number = re.fullmatch(r'\d+(e\d+)?', name)
            return -file[2], (0, float(name)) if number else (1, name)
        groups = {}
        for file in sorted(self.tree.files, key=lambda file: (same(file), file[:2])):
            groups.setdefault(same(file), []).append(file)
        groups = [group for group in groups.values() if len(group) > 1]
        return [(number, *file[:4]) for number, group in enumerate(groups, 1) for file in group]

    def assertByTime(self, folder, name, variable, files):
        rows = [file[:4] for file in files]
        self.assertIn(block(variable, rows[:200]), data_blocks(folder))
        self.assertEqual(self.csv(folder, name),
                         csv('Share\tFile\tSize(Byte)\tModify Time',
                             [(*row[:3], local_time(row[3])) for row in rows[:10000]]))

    def assertDuplicates(self, folder, rows):
        self.assertIn(block('vornDuplicateFileData', [row for row in rows if row[0] <= 200],
                            b'var vornDuplicateHashMatch = 0;\n'), data_blocks(folder))
        self.assertEqual(self.csv(folder, 'duplicate_file'), csv(
            DUPLICATE_HEADER, [(*row[:4], local_time(row[4])) for row in rows]))


class Reports(ReportTest):
    @needs_root
    def test_every_report_of_one_run(self):
        add = self.tree.add
        for owner, name in enumerate(('IMG_1.JPG', "it's.JPG", 'Übergröße.JPG')):
            add('photos', name, 5000 + owner, 3001 + owner, 100 + owner, 'image')
            add('backup', 'copy of/' + name, 5000 + owner, 3001, 8, 'image')
        add('photos', 'one byte more/IMG_1.JPG', 5001, 3002, 100, 'image')
        add('docs & more', 'no type', 0, 3002)
        add('docs & more', 'nobody.txt', 77, UNKNOWN, 1, 'text')
        add('backup', 'nobody.txt', 78, UNKNOWN, 2, 'text')
        add('docs & more', 'big.mkv', (5 << 30) + 1, 0, 3, 'video')
        add('docs & more', 'future.txt', 10, 0, -2, 'text')
        hour = 1 / 24
        for i, days in enumerate((7 - hour, 7 + hour, 90 - hour, 90 + hour, 20000, 0)):
            add('ages', f'{i}.odt', 100 + i, 3003, days, 'document')
        # Shares that an owner has equally many bytes in: the one with more files first.
        for i in range(2):
            add('ages', f'half{i}', 6, 3004)
        add('backup', 'whole', 12, 3004)
        # Names of numbers: 007 is 7, 1e3 is 1000, and digits beyond the fifteenth don't count.
        for name in ('007', '7', '1e3', '1000', '12345678901234567890', '12345678901234567891',
                     '70', '007.odt', '7.odt'):
            add('numbers', name, 3, 3001, label='document' if 'odt' in name else 'other')

        folder = self.report(
            log=[r'src/rep_file_owner:\d+ .*get user name failed'] * 2
            + [r'src/rep_file_group:\d+ .*user get failed, user=nobody-such'],
            report_list='most_modify,least_modify,large_file,duplicate_file,file_group,share_list,'
            'file_owner', limit_user='ann,,john-doe,nobody-such,eve')
        files = self.tree.files

        owners = self.owner_rows()
        self.assertEqual([row[1] for row in owners if row[0] == 'eve'], ['ages', 'backup'])
        self.assertEqual(self.csv(folder, 'file_owner'),
                         csv('Owner\tShare\tFile Count\tSize(Byte)', owners))
        self.assertEqual(self.csv(folder, 'file_group'), GROUP_HEADER)
        duplicates = self.duplicates()
        self.assertEqual({os.path.basename(row[2]) for row in duplicates if row[3] == 3},
                         {'007', '7', '1e3', '1000', '12345678901234567890',
                          '12345678901234567891'})
        self.assertDuplicates(folder, duplicates)
        now = self.tree._now
        by_time = sorted(files, key=lambda file: file[3])
        oldest = [file for file in by_time if file[3] < now - 90 * DAY]
        newest = [file for file in by_time[::-1] if file[3] > now - 7 * DAY]
        self.assertByTime(folder, 'least_modify', 'vornLeastModifyData', oldest)
        self.assertByTime(folder, 'most_modify', 'vornMostModifyData', newest)

        # All that the page holds, in the order of the registry.
        sizes = totals((file[0], file[2]) for file in files)
        data = data_blocks(folder)
        volume = page_rows(folder / 'report.html', 'vornShareListData')[0][1]
        large = [file[:3] for file in sorted(files, key=lambda file: -file[2])]
        found = page_rows(folder / 'report.html', 'vornLargeFileData')
        self.assertEqual([int(row[2]) for row in found], [row[2] for row in large])
        self.assertCountEqual([(row[0].decode(), row[1].decode(), int(row[2])) for row in found],
                              large)
        self.assertEqual(data, b''.join((
            block('vornFileOwnerData', owners),
            block('vornShareListData', [(share, volume, size) for share, (_, size) in sorted(
                sizes.items(), key=lambda item: -item[1][1])]),
            self.group_block('ann', 'john-doe', 'eve'),
            self.tree.share_paths(),
            block('vornDuplicateFileData', duplicates, b'var vornDuplicateHashMatch = 0;\n'),
            block('vornLargeFileData', found),
            block('vornLeastModifyData', [file[:4] for file in oldest]),
            block('vornMostModifyData', [file[:4] for file in newest]))))

    def test_page_limits(self):
        for i in range(250):
            for half in 'ab':
                self.tree.add('many', f'{half}/{i:03}.txt', 9, None, 100 if half == 'a' else 1)
        folder = self.report(report_list='duplicate_file,least_modify,most_modify',
                             duplicate_compare='false')
        rows = self.duplicates()
        self.assertEqual(rows[-1][0], 250)
        self.assertDuplicates(folder, rows)
        by_time = sorted(self.tree.files, key=lambda file: file[3])
        self.assertByTime(folder, 'least_modify', 'vornLeastModifyData', by_time[:250])
        self.assertByTime(folder, 'most_modify', 'vornMostModifyData', by_time[:-251:-1])

    @needs_root
    def test_a_hundred_group_rows_for_all_sections(self):
        # 90 rows for all files, 10 of ann's 18, none of bob's.
        for label, ending in LABELS.items():
            for share in range(5):
                self.tree.add(f's{share}', 'file.' + ending, share + 1, 3001 if share else 3002,
                              label=label)
        folder = self.report(report_list='file_group', limit_user='ann,bob')
        whole = self.group_block('ann').decode()
        rows = whole.split(',\n')
        self.assertEqual(len(rows), 90 + 72)
        self.assertEqual(data_blocks(folder).decode(),
                         ',\n'.join(rows[:100]) + '\n]\n' + '\n]\n' + '\n}</script>\n')

    def test_no_rows(self):
        self.m.share('empty')
        for mode, header in (('false', csv(DUPLICATE_HEADER, [])), ('true', b'')):
            with self.subTest(mode):
                folder = self.report(report_list='file_owner,file_group,duplicate_file,'
                                     'least_modify,most_modify', duplicate_compare=mode)
                self.assertEqual(data_blocks(folder), b'</script>\n\n}</script>\n' +
                                 b'</script>\n' * 3)
                self.assertEqual(self.csv(folder, 'duplicate_file'), header)
                self.assertEqual(self.csv(folder, 'file_group'), GROUP_HEADER)


def by_content(files):
    """(groups, printed lines) of the pairwise walk over files of one size, largest size first."""
    groups, lines = [], []
    digested = grouped = 0
    for size in sorted({file[2] for file in files}, reverse=True):
        bucket = sorted(file for file in files if file[2] == size)
        content = {file: Path(file[1]).read_bytes() for file in bucket}
        middle = size // 2 // 4096 * 4096 if size > 4096 else 0
        sample = {file: content[file][middle:middle + 4096] for file in bucket}
        taken, known = set(), set()
        for i, first in enumerate(bucket):
            chain = []
            for second in bucket[i + 1:] if first not in taken else ():
                if second in taken or sample[first] != sample[second]:
                    continue
                digested += len({first, second} - known)
                known |= {first, second} if size else set()
                if content[first] != content[second]:
                    lines.append(f'##### match({grouped}/{digested}), '
                                 f'not match file=({first[1]},{second[1]})')
                    continue
                grouped += 1 if chain else 2
                chain = [second, *(chain or [first])]
                taken.add(second)
            if chain:
                groups.append(chain)
    return groups, lines


class Content(ReportTest):
    def assertContentRight(self, folder):
        files = [file[:4] for file in self.tree.files]
        groups, lines = by_content(files)
        rows = [(number, *file) for number, group in enumerate(groups, 1) for file in group]
        self.assertEqual(data_blocks(folder), self.tree.share_paths() + SCRIPT +
                         b'var vornDuplicateHashMatch = 1;\nvar vornDuplicateFileData = [\n' +
                         b',\n'.join(f"[ '{number}', '{share}', '{path}', {size}, {changed} ]"
                                     .encode() for number, share, path, size, changed in rows
                                     if number <= 200) + b'\n];\n</script>\n')
        self.assertEqual(self.csv(folder, 'duplicate_file'),
                         MARK + DUPLICATE_HEADER.encode() + b'\n' + b''.join(
                             f'{number}\t{share}\t{path}\t{size}\t{local_time(changed)}\n'.encode()
                             for number, share, path, size, changed in rows))
        printed = re.findall(r'^\(src/rep_duplicate_file:\d+\)(##### .*)$', self.run_done.out,
                             re.MULTILINE)
        self.assertEqual(printed, lines)
        return groups, lines

    def test_by_content(self):
        add = self.tree.add
        large = os.urandom(10000)
        other_middle = large[:5000] + b'other' + large[5005:]
        for name, content in (('a', large), ('b', large), ('c', b'x' + large[1:]),
                              ('d', other_middle), ('e', large), ('f', b'x' + large[1:]),
                              ('g', large[:-1] + b'z'), ('single', large + b'.'),
                              ('h', other_middle)):
            add('docs', name, content)
        for i, content in enumerate((b'p' * 3000, b'q' * 3000, b'p' * 3000, b'p' * 2999 + b'q')):
            add('other', f'small{i}', content)
        for i in range(4):
            add('docs' if i % 2 else 'other', f'empty{i}')
        for size in (4096, 4097, 8191, 8192):
            for i in range(2):
                add('edge', f'{size}-{i}', b'e' * size)
        folder = self.report(report_list='duplicate_file', duplicate_compare='True')
        groups, lines = self.assertContentRight(folder)
        self.assertEqual([len(group) for group in groups], [3, 2, 2, 2, 2, 2, 2, 2, 4])
        self.assertGreater(len(lines), 3)

    def test_page_limit(self):
        for i in range(205):
            for half in 'ab':
                self.tree.add('many', f'{i}{half}', b'%d' % i)
        groups, _ = self.assertContentRight(
            self.report(report_list='duplicate_file', duplicate_compare='TRUE'))
        self.assertEqual(len(groups), 205)


if __name__ == '__main__':
    unittest.main()
