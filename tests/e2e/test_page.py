"""The finished page in a browser: hostile names, all sections, and blocks that no script runs."""
import html
import os
import re
import subprocess
import tempfile
import time

from expected import SCRIPT, Tree
from harness import LIMIT, SCRIPTS, ProductTest, needs_root

NAMES = {  # name to how it must be shown
    'plain \u65e5\u672c.txt': None,
    '<img src=x onerror="document.title=1">': None,
    "x'];document.title=1;['.txt": None,
    '<script>document.title=1;<': None,
    '&amp;&lt;b&gt;': None,
    'line\nend\x1b[31m': 'line[U+000A]end[U+001B][31m',
    'gnp.\u202egpj.exe': 'gnp.[U+202E]gpj.exe',
    'zero\u200bwidth\u2028': 'zero[U+200B]width[U+2028]',
    'bytes\udcff\udcc3': 'bytes[\\xff][\\xc3]',
}
COLUMNS = {
    'quota_usage': [],
    'file_owner': ['Owner', 'Share', 'Files', 'Size'],
    'volume_usage': ['Volume', 'Used', 'Free', 'Used %', 'Days to full'],
    'share_list': ['Share', 'Volume', 'Size'],
    'file_group': ['Type', 'Share', 'Size'] * 3,
    'duplicate_file': ['Group', 'Share', 'File', 'Size', 'Changed'],
    'large_file': ['Share', 'File', 'Size'],
    'least_modify': ['Share', 'File', 'Size', 'Changed'],
    'most_modify': ['Share', 'File', 'Size', 'Changed'],
}
DAMAGED = ['The data of this report is damaged. The run\u2019s log says why.']
MISSING = [DAMAGED[0].replace('damaged', 'missing')]
FOUR = '4\u00a0B'


def show(page):
    """The page's document after its script has run."""
    with tempfile.TemporaryDirectory(prefix='vorn-browser-', dir='/var/tmp') as profile:
        return subprocess.run(
            ['chromium', '--headless', '--no-sandbox', '--disable-gpu', '--disable-quic',
             '--no-first-run', '--disable-background-networking', '--disable-component-update',
             '--disable-sync', f'--user-data-dir={profile}', '--virtual-time-budget=5000',
             '--dump-dom', f'file://{page}'], stdout=subprocess.PIPE, stderr=subprocess.DEVNULL,
            env=os.environ | {'HOME': profile}, check=True, timeout=LIMIT).stdout.decode()


class Section:
    """One report as it is shown; a chip's text stands in brackets."""

    def __init__(self, document, report):
        text = re.search(f'<section data-report="{report}">(.*?)</section>', document, re.DOTALL)[1]
        text = re.sub('<span class="chip">(.*?)</span>', r'[\1]', text)

        def cells(tag, inside=text):
            return [html.unescape(re.sub('<.*?>', '', cell)) for cell in
                    re.findall(f'<{tag}(?: [^>]*)?>(.*?)</{tag}>', inside, re.DOTALL)]
        self.heading, = cells('h2')
        self.captions, self.columns = cells('caption'), cells('th')
        rows = re.findall('<tr>(.*?)</tr>', text, re.DOTALL)
        self.rows = [cells('td', row) for row in rows if '<td' in row]
        self.notes = re.findall('<p class="note">(.*?)</p>', text)


@needs_root
class Page(ProductTest):
    def setUp(self):
        super().setUp()
        self.m.accounts({'root': 0, 'john-doe': 3003, 'ann': 3001})
        tree = Tree(self.m)
        tree.add('docs', 'a/plan.odt', b'plan', owner=3003, days=100)
        tree.add('docs', 'b/plan.odt', b'same', owner=3001, days=0)
        tree.add('docs', 'c.JPG', b'same', days=0)
        tree.add('big & small', 'f', 3 << 30)
        for i, name in enumerate(NAMES):
            tree.add('big & small', name, 1500 - i)
        self.changed = tree.files[0][3]

    def page(self, **keys):
        self.m.profile('all', report_list=','.join(COLUMNS), limit_user='john-doe,ann', **keys)
        run = self.m.run('--report', 'all')
        self.assertEqual(self.m.status('all'), 'success', run.log_lines)
        return self.m.report_folders('all')[-1] / 'report.html'

    def test_every_section(self):
        page = self.page()
        document = show(page)
        self.assertEqual(re.findall('<section data-report="(.*?)"', document), list(COLUMNS))
        shown = {report: Section(document, report) for report in COLUMNS}
        self.assertEqual({report: part.columns for report, part in shown.items()}, COLUMNS)
        self.assertEqual({report: part.notes for report, part in shown.items() if part.notes}, {
            'quota_usage': ['No quotas could be read: no volume has user quotas, or /sbin/repquota '
                            'is missing. The run\u2019s log says which.'],
            'volume_usage': ['No days to full are estimated: the profile doesn\u2019t set '
                             'volume_history = true.']})
        folder = self.m.base / 'shares/big & small'
        self.assertEqual([row[1] for row in shown['large_file'].rows[:10]],
                         [f'{folder}/f', *(f'{folder}/{show_as or name}'
                                           for name, show_as in NAMES.items())])
        self.assertEqual(shown['large_file'].rows[0][2], '3\u00a0GiB')
        self.assertEqual([[row[0], row[2]] for row in shown['share_list'].rows],
                         [['big & small', '3\u00a0GiB'], ['docs', '12\u00a0B']])
        self.assertEqual(shown['file_owner'].rows[1:],
                         [[user, 'docs', '1', FOUR] for user in ('root', 'ann', 'john-doe')])
        self.assertEqual({row[4] for row in shown['volume_usage'].rows}, {'\u2013'})
        # The name john-doe is no key of a JavaScript object: the block can't run, and is read.
        self.assertEqual(shown['file_group'].captions, ['All files', 'john-doe', 'ann'])
        documents = ['Documents', 'docs', FOUR]
        self.assertEqual([row for row in shown['file_group'].rows if row[1] == 'docs'],
                         [documents[:2] + ['8\u00a0B'], ['Images', 'docs', FOUR], *[documents] * 2])
        self.assertEqual(shown['duplicate_file'].heading, 'Duplicate files: same name and size')
        self.assertEqual([row[0] for row in shown['duplicate_file'].rows], ['1', '1'])
        day = time.localtime(self.changed)
        self.assertIn(f'{day.tm_mday}, {day.tm_year}', shown['least_modify'].rows[0][3])
        self.assertEqual(len(shown['most_modify'].rows), 2)
        self.assertIn('title="3,221,225,472 bytes"', document)
        self.assertRegex(document, r'<title>Storage report \u2013 [\w.-]+</title>')
        for nowhere in ('<img', 'href="csv/quota_usage.csv"', 'src="http', 'href="http', '="//'):
            self.assertNotIn(nowhere, document)

    def test_content_mode_and_history(self):
        document = show(self.page(duplicate_compare='true', volume_history='true', language='de'))
        shown = Section(document, 'duplicate_file')
        self.assertEqual(shown.heading, 'Doppelte Dateien: gleicher Inhalt')
        self.assertEqual([(row[0], row[2].rsplit('/')[-1], row[3]) for row in shown.rows],
                         [('1', 'c.JPG', FOUR), ('1', 'plan.odt', FOUR)])
        self.assertIn('Alle Dateien', Section(document, 'file_group').captions)
        self.assertIn('0 Tage: ', Section(document, 'volume_usage').notes[0])

    def with_block(self, page, variable, block):
        """A copy of the page with the variable's block replaced or put in."""
        new = block if block[:1] not in '[{' else SCRIPT.decode() + f'var {variable} = {block}'
        blocks, body = re.split('<meta name="vorn-empty.*\n</head>\n<body>\n', page)
        old = re.search(f'{SCRIPT.decode()}var {variable} = .*?</script>\n', blocks, re.DOTALL)
        copy = self.m.base / 'changed.html'
        copy.write_text(blocks.replace(old[0], new) if old else blocks + new)
        # The end of the head is what the template script makes of the blocks.
        subprocess.run([self.m.stage / SCRIPTS / 'build-template.sh', 'header', copy, 'share_list'],
                       check=True)
        copy.write_text(copy.read_text() + body)
        return copy

    def test_damage_stays_in_its_section(self):
        page = self.page(volume_history='true').read_text()
        table, end = 'vornFileGroupTableData', '</script>\n'
        groups = ''.join(f"[ 'reportUI_file_type_text', 's{i}', 1024 ],\n" for i in range(99))
        group = "[ 'reportUI_file_type_odd', 's', 1 ]"
        keys = ('vornAll', '007', '__proto__', 'DOM/the user')
        quotas = ("{\n'/' : [\n['ann', 0, 2048, -1.0],\n['john-doe', 1024, 1536, 150.0]] , \n"
                  "'/mnt/__proto__' : [\n] , \n'/b' : [\n"
                  + ',\n'.join(f"['u{i}', 0, 0, -1.0]" for i in range(100)) + f']}}\n{end}')
        volume = "[ '/', 3 , 1, '75.0000%', '12' ]"
        for name, report, variable, block, captions, rows, notes in (
                ('cut short', 'share_list', 'vornShareListData', "[\n[ 'docs', '/", [], 0, DAMAGED),
                ('bad row', 'share_list', 'vornShareListData',
                 f"[\n[ 'docs', it's, '1' ]\n];\n{end}", [], 0, DAMAGED),
                ('column lost', 'share_list', 'vornShareListData',
                 f"[\n[ 'docs', '/' ]\n];\n{end}", [], 0, DAMAGED),
                ('missing', 'share_list', 'vornShareListData', '', [], 0, MISSING),
                ('empty', 'large_file', 'vornLargeFileData', end, [], 0, ['No rows']),
                ('full', 'large_file', 'vornLargeFileData',
                 '[\n' + ',\n'.join(["[ 's', '/f', '1' ]"] * 200) + f'\n];\n{end}', [], 200,
                 ['The first 200 rows; the CSV file holds more.']),
                ('keys', 'file_group', table, '{\n' + ',\n'.join(
                    f'{key} : [\n{group}\n]\n' for key in keys) + f'\n}}{end}',
                 ['All files', *keys[1:]], 4, []),
                ('stray ends', 'file_group', table,
                 f'{{\nvornAll : [\n{groups}{group}]\n\n]\n\n]\n\n}}{end}',
                 ['All files'], 100, ['100 rows in all; what is beyond is not shown.']),
                ('group cut', 'file_group', table, f'{{\nvornAll : [\n{group}{end}', [], 0, DAMAGED),
                ('half a row', 'file_group', table, f"{{\nvornAll : [\n[ 'a', 's ]\n}}{end}",
                 [], 0, DAMAGED),
                ('no groups', 'file_group', table, f'\n}}{end}', [], 0, ['No rows']),
                ('quotas', 'quota_usage', 'vornQuotaUsageTable', quotas,
                 ['/', '/mnt/__proto__', '/b'], 102,
                 ['The 100 users of the smallest usage; more are not shown.']),
                ('volumes', 'volume_usage', 'vornVolumeUsageData',
                 f"[\n{volume},\n[ '/b', 0 , 0, '-nan%', '0' ]\n];\n{end}", [], 2,
                 ['0 days: full within a day, or usage has not been seen to grow.']),
                ('nan', 'volume_usage', 'vornVolumeUsageData',
                 f"[\n{volume.replace('3', 'nan')}\n];\n{end}", [], 0, DAMAGED)):
            with self.subTest(name):
                document = show(self.with_block(page, variable, block))
                shown = Section(document, report)
                self.assertEqual((shown.captions, len(shown.rows), shown.notes),
                                 (captions, rows, notes))
                expected = {'quotas': [['ann', 'no limit', '2\u00a0KiB', '\u2013'],
                                       ['john-doe', '1\u00a0KiB', '1.5\u00a0KiB', '150\u00a0%']],
                            'volumes': [['/', '3\u00a0B', '1\u00a0B', '75\u00a0%', '12'],
                                        ['/b', '0\u00a0B', '0\u00a0B', '\u2013', '0']]}
                self.assertEqual(shown.rows[:2], expected.get(name, shown.rows[:2]))
                # Nothing else broke, and no rest of a block is shown.
                body = re.sub('<(script|style).*?</\\1>', '', document, flags=re.DOTALL)
                self.assertNotIn('}', body)
                self.assertEqual((len(Section(document, 'file_owner').rows),
                                  len(Section(document, 'most_modify').rows)), (4, 2))
