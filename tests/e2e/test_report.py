"""A report run on a real tree, compared with what the tree demands."""
import os
import re
import unittest

from harness import (ProductTest, csv_field, make_files, page_rows, regular_files, signal)

MARK = b'\xef\xbb\xbf'
ODD_NAMES = {
    "it's.jpg": 1001,
    'say "hi".png': 1002,
    'line\nbreak\tand tab.txt': 1003,
    b'bytes\xff\xc3.bin': 1004,
    '<script>alert(1)<': 1005,
    'gnp.\u202egpj.exe': 1006,
    'back\\slash\\n': 1007,
    '=1+1.csv': 1008,
    '\u65e5\u672c \u00e4\u0308.mkv': 1009,
    '.hidden/.profile': 1010,
    'ends in a dot.': 0,
    ' blank ': 1,
    '@eaDir/thumb.jpg': 10 ** 9,
    'sub/@eaDir/deep/thumb.jpg': 10 ** 9,
}


def make_tree(m):
    photos, projects = m.share('photos'), m.share('Projekte & mehr')
    make_files(photos, ODD_NAMES)
    make_files(projects, {'d/' * 300 + 'deep': 2001, 'sparse.img': (5 << 30) + 7,
                          'n' * 255: 2002})
    os.symlink(photos / "it's.jpg", photos / 'link.jpg')
    os.symlink(projects, photos / 'folder link')
    os.symlink('nowhere', photos / 'dangling')
    os.mkfifo(photos / 'pipe')
    os.link(projects / 'sparse.img', projects / 'second name.img')
    return {'photos': photos, 'Projekte & mehr': projects}


class Report(ProductTest):
    def setUp(self):
        super().setUp()
        self.shares = make_tree(self.m)
        self.m.profile('weekly', report_list='share_list,large_file')

    def expected_files(self):
        return sorted(((share.encode(), path, b'%d' % size)
                       for share, folder in self.shares.items()
                       for path, size in regular_files(folder)), key=lambda row: -int(row[2]))

    def assertReportRight(self, folder):
        files = self.expected_files()
        totals = {}
        for share, _, size in files:
            totals[share] = totals.get(share, 0) + int(size)
        self.assertEqual(sorted(p.relative_to(folder).as_posix() for p in folder.rglob('*')),
                         ['csv', 'csv/large_file.csv', 'csv/share_list.csv', 'report.html'])
        page = folder / 'report.html'

        rows = page_rows(page, 'vornShareListData')
        volume = rows[0][1]
        self.assertRegex(volume, rb'^[\w./ :-]+$')
        by_size = sorted(totals.items(), key=lambda item: -item[1])
        self.assertEqual(rows, [[share, volume, b'%d' % size] for share, size in by_size])
        self.assertEqual((folder / 'csv/share_list.csv').read_bytes(),
                         MARK + b'Share\tSize\n' +
                         b''.join(b'"%s"\t"%s"\t"%d"\n' % (share, volume, size)
                                  for share, size in by_size))

        rows = page_rows(page, 'vornLargeFileData')
        self.assertEqual([int(row[2]) for row in rows], [int(row[2]) for row in files])
        self.assertCountEqual(map(tuple, rows), files)
        self.assertEqual((folder / 'csv/large_file.csv').read_bytes(),
                         MARK + b'Share\tFile\tSize(Byte)\n' +
                         b''.join(b'\t'.join(map(csv_field, row)) + b'\n' for row in rows))

        text = page.read_text()
        self.assertTrue(text.startswith('<!DOCTYPE html>\n') and text.endswith('\n</html>\n'))
        marks = [text.index(mark) for mark in (
            "\nvar vornLang = 'en';\n", '\nvar vornShareListData = [\n',
            '\nvar vornSharePath = {\n', '\nvar vornLargeFileData = [\n', '</head>', '<section data-report="share_list">',
            '<section data-report="large_file">')]
        self.assertEqual(marks, sorted(marks))

    def test_rows_and_files_are_exact(self):
        run = self.m.run('--report', 'weekly')
        first = self.assertSucceeded(run, 'weekly')
        self.assertReportRight(first)
        self.assertEqual(sorted(os.listdir(self.m.reports / 'weekly/template')),
                         ['lang', 'report.css', 'report.js'])
        self.assertEqual(re.findall(r'\(src/file_gathering:\d+\)(.*)\n', run.out),
                         ['stat start', 'stat share=photos', 'stat share=Projekte & mehr',
                          'stat complete'])
        self.assertIn('(src/vornreport:134)get link=file://', run.out)

        # Runs of one second have names of their own.
        second = self.assertSucceeded(self.m.run('--report', 'weekly'), 'weekly')
        third = self.assertSucceeded(self.m.run('--report', 'weekly'), 'weekly')
        self.assertEqual(self.m.report_folders('weekly'), [first, second, third])
        for report in (first, second, third):
            self.assertReportRight(report)

    def test_a_killed_run_leaves_nothing_to_the_next(self):
        for stop in ('lang', 'body 2', 'tail'):
            with self.subTest(stop):
                self.m.stop_at(stop)
                run = self.m.start('--report', 'weekly')
                child = self.m.stopped_pid()
                run.signal(signal.SIGKILL)
                os.kill(child, signal.SIGKILL)
                run.finish()
                self.m.go_on()
                self.assertNotEqual(self.m.leftovers(), [])
                folder = self.assertSucceeded(self.m.run('--report', 'weekly'), 'weekly')
                self.assertReportRight(folder)

    def test_only_selected_shares_and_reports(self):
        make_files(self.m.share('empty'), {})
        self.m.profile('some', report_list='large_file_db', share_list='empty, photos')
        self.m.profile('none', report_list='large_file,share_list', share_list='empty')
        some = self.assertSucceeded(self.m.run('--report', 'some'), 'some')
        self.assertIsNone(page_rows(some / 'report.html', 'vornShareListData'))
        self.assertEqual({row[0] for row in page_rows(some / 'report.html', 'vornLargeFileData')},
                         {b'photos'})
        none = self.assertSucceeded(self.m.run('--report', 'none'), 'none')
        self.assertIn('</script>\n</script>\n</script>\n', (none / 'report.html').read_text())
        self.assertEqual((none / 'csv/share_list.csv').read_bytes(), MARK + b'Share\tSize\n')


if __name__ == '__main__':
    unittest.main()
