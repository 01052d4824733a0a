"""The sections of all reports in a browser: real data, and blocks that no script could run."""
import re
import time
import unittest

from expected import SCRIPT, Tree, needs_root
from harness import ProductTest
from test_page import section, show

REPORTS = ('quota_usage', 'file_owner', 'volume_usage', 'share_list', 'file_group',
           'duplicate_file', 'large_file', 'least_modify', 'most_modify')
COLUMNS = {
    'quota_usage': ['User', 'Quota', 'Used', 'Used %'],
    'file_owner': ['Owner', 'Share', 'Files', 'Size'],
    'volume_usage': ['Volume', 'Used', 'Free', 'Used %', 'Days to full'],
    'file_group': ['Type', 'Share', 'Size'],
    'duplicate_file': ['Group', 'Share', 'File', 'Size', 'Changed'],
    'least_modify': ['Share', 'File', 'Size', 'Changed'],
    'most_modify': ['Share', 'File', 'Size', 'Changed'],
}
NO_ESTIMATE = 'No days to full are estimated: the profile doesn\u2019t set volume_history = true.'
DAYS_ZERO = '0 days: full within a day, or usage has not been seen to grow.'
DAMAGED = 'The data of this report is damaged. The run\u2019s log says why.'
NO_QUOTAS = ('No quotas could be read: no volume has user quotas, or /sbin/repquota is missing. '
             'The run\u2019s log says which.')


def captions(document):
    return re.findall('<caption>(.*?)</caption>', document)


def heading(document, report):
    return re.search(f'<section data-report="{report}">\n<h2>(.*?)</h2>', document)[1]


@needs_root
class PageOfAll(ProductTest):
    def setUp(self):
        super().setUp()
        passwd = self.m.base / 'passwd'
        passwd.write_text('root:x:0:0::/:\njohn-doe:x:3003:0::/:\nann:x:3001:0::/:\n')
        self.m.options += ['--bind', passwd, '/etc/passwd']
        tree = Tree(self.m)
        tree.add('docs', 'a/plan.odt', b'plan', 3003, 100)
        tree.add('docs', 'b/plan.odt', b'same', 3001, 0)
        tree.add('docs', 'c.JPG', b'same', 0, 0)
        self.changed = tree.files[0][3]

    def page(self, **keys):
        self.m.profile('all', report_list=','.join(REPORTS), limit_user='john-doe,ann', **keys)
        run = self.m.run('--report', 'all')
        self.assertEqual(self.m.status('all'), 'success', run.log_lines)
        return self.m.report_folders('all')[-1] / 'report.html'

    def with_blocks(self, page, **blocks):
        """A copy of the page with each variable's block replaced (or put in)."""
        text = page.read_bytes()
        for name, body in blocks.items():
            block = re.compile(SCRIPT + b'var ' + name.encode() + b' = .*?</script>\n', re.DOTALL)
            new = SCRIPT + f'var {name} = {body}</script>\n'.encode()
            if block.search(text):
                text = block.sub(lambda _: new, text)
            else:
                text = text.replace(b'<meta name="vorn-empty', new + b'<meta name="vorn-empty')
        copy = self.m.base / 'changed.html'
        copy.write_bytes(text)
        return copy

    def test_every_section(self):
        page = self.page()
        document = show(page)
        self.assertEqual(re.findall('<section data-report="(.*?)"', document), list(REPORTS))
        for report, columns in COLUMNS.items():
            if report not in ('quota_usage', 'file_group'):
                self.assertEqual(section(document, report)[0], columns)
        self.assertEqual(section(document, 'quota_usage'), ([], [], [NO_QUOTAS]))
        self.assertEqual(section(document, 'file_owner')[1],
                         [['root', 'docs', '1', '4\u00a0B'], ['ann', 'docs', '1', '4\u00a0B'],
                          ['john-doe', 'docs', '1', '4\u00a0B']])
        _, rows, notes = section(document, 'volume_usage')
        self.assertEqual(({row[4] for row in rows}, notes), ({'\u2013'}, [NO_ESTIMATE]))
        # The name john-doe is no key of a JavaScript object: the block can't run, and is read.
        self.assertEqual(captions(document), ['All files', 'john-doe', 'ann'])
        images, documents = ['Images', 'docs', '4\u00a0B'], ['Documents', 'docs', '4\u00a0B']
        self.assertEqual(section(document, 'file_group')[1],
                         [documents[:2] + ['8\u00a0B'], images, documents, documents])
        self.assertEqual(heading(document, 'duplicate_file'),
                         'Duplicate files: same name and size')
        self.assertEqual([row[0] for row in section(document, 'duplicate_file')[1]], ['1', '1'])
        oldest = section(document, 'least_modify')[1][0]
        shown = time.localtime(self.changed)
        self.assertIn(f'{shown.tm_mday}, {shown.tm_year}', oldest[3])
        self.assertEqual(len(section(document, 'most_modify')[1]), 2)
        self.assertNotIn('href="csv/quota_usage.csv"', document)

    def test_content_mode_and_history(self):
        document = show(self.page(duplicate_compare='true', volume_history='true', language='de'))
        self.assertEqual(heading(document, 'duplicate_file'), 'Doppelte Dateien: gleicher Inhalt')
        rows = section(document, 'duplicate_file')[1]
        self.assertEqual([(row[0], row[2].rsplit('/')[-1], row[3]) for row in rows],
                         [('1', 'c.JPG', '4\u00a0B'), ('1', 'plan.odt', '4\u00a0B')])
        self.assertIn('Alle Dateien', captions(document))
        self.assertIn('0 Tage: ', section(document, 'volume_usage')[2][0])

    def test_hard_blocks(self):
        page = self.page()
        rows = ''.join(f"[ 'reportUI_file_type_text', 's{i}', 1024 ]," + '\n' for i in range(99))
        group = "[ 'reportUI_file_type_odd', 's', 1 ]"
        quotas = ("{\n'/' : [\n['ann', 0, 2048, -1.0],\n['john-doe', 1024, 1536, 150.0]] , \n"
                  "'/mnt/__proto__' : [\n] , \n'/b' : [\n"
                  + ',\n'.join(f"['u{i}', 0, 0, -1.0]" for i in range(100)) + ']}\n')
        cut = '100 rows in all; what is beyond is not shown.'
        users = 'The 100 users of the smallest usage; more are not shown.'
        for name, blocks, report, expected in (
                ('keys', {'vornFileGroupTableData': '{\n' + ',\n'.join(
                    f'{key} : [\n{group}\n]\n' for key in
                    ('vornAll', '007', '__proto__', 'DOM/the user')) + '\n}'},
                 'file_group', (['All files', '007', '__proto__', 'DOM/the user'], 4, [])),
                ('stray ends', {'vornFileGroupTableData':
                                f'{{\nvornAll : [\n{rows}{group}]\n\n]\n\n]\n\n}}'},
                 'file_group', (['All files'], 100, [cut])),
                ('cut short', {'vornFileGroupTableData': f'{{\nvornAll : [\n{group}'},
                 'file_group', ([], 0, [DAMAGED])),
                ('half a row', {'vornFileGroupTableData': "{\nvornAll : [\n[ 'a', 's ]\n}"},
                 'file_group', ([], 0, [DAMAGED])),
                ('quotas', {'vornQuotaUsageTable': quotas, 'vornQuotaUsageData':
                            "{\n'/' : {\n\traw : [\n[[0, 0, -nan]]\n],\n}}\n"},
                 'quota_usage', (['/', '/mnt/__proto__', '/b'], 102, [users])),
                ('volumes', {'vornVolumeUsageData': "[\n[ '/', 3 , 1, '75.0000%', '12' ],\n"
                             "[ '/b', 0 , 0, '-nan%', '0' ]\n];\n",
                             'vornVolumeUsageDataHistory': "{\n'/' : [\n[ '1', 75.0 ]\n]\n};\n"},
                 'volume_usage', ([], 2, [DAYS_ZERO])),
                ('nan', {'vornVolumeUsageData': "[\n[ '/', nan , 1, '75.0000%', '12' ]\n];\n"},
                 'volume_usage', ([], 0, [DAMAGED]))):
            with self.subTest(name):
                document = show(self.with_blocks(page, **blocks))
                inside = document[document.index(f'<section data-report="{report}">'):]
                _, rows, notes = section(document, report)
                self.assertEqual((captions(inside.split('</section>')[0]), len(rows), notes),
                                 expected)
                if name == 'quotas':
                    self.assertEqual(rows[:2], [['ann', 'no limit', '2\u00a0KiB', '\u2013'], [
                        'john-doe', '1\u00a0KiB', '1.5\u00a0KiB', '150\u00a0%']])
                if name == 'volumes':
                    self.assertEqual(rows, [
                        ['/', '3\u00a0B', '1\u00a0B', '75\u00a0%', '12'],
                        ['/b', '0\u00a0B', '0\u00a0B', '\u2013', '0']])
                # Nothing else broke.
                self.assertEqual(len(section(document, 'file_owner')[1]), 3)
                self.assertEqual(len(section(document, 'most_modify')[1]), 2)

    def test_nothing_at_all(self):
        self.m.shares.write_text('')
        self.m.share('empty')
        document = show(self.page())
        for report in ('file_owner', 'share_list', 'file_group', 'duplicate_file', 'large_file'):
            self.assertEqual(section(document, report), ([], [], ['No rows']))
        body = re.sub('<(script|style).*?</\\1>', '', document, flags=re.DOTALL)
        self.assertNotIn('}', body)


if __name__ == '__main__':
    unittest.main()
