"""The finished page in a browser."""
import html
import os
import re
import subprocess
import tempfile
import unittest

from harness import LIMIT, ProductTest, make_files

NAMES = {  # name to how it must be shown
    'plain \u65e5\u672c.txt': None,
    '<img src=x onerror="document.title=1">': None,
    "x'];document.title=1;['.txt": None,
    '<script>document.title=1;<': None,
    '&amp;&lt;b&gt;': None,
    'line\nend\x1b[31m': 'line[U+000A]end[U+001B][31m',
    'gnp.\u202egpj.exe': 'gnp.[U+202E]gpj.exe',
    'zero\u200bwidth\u2028': 'zero[U+200B]width[U+2028]',
    b'bytes\xff\xc3': 'bytes[\\xff][\\xc3]',
}


def show(page):
    """The page's document after its script has run."""
    with tempfile.TemporaryDirectory(prefix='vorn-browser-', dir='/var/tmp') as profile:
        return subprocess.run(
            ['chromium', '--headless', '--no-sandbox', '--disable-gpu', '--disable-quic',
             '--no-first-run', '--disable-background-networking', '--disable-component-update',
             '--disable-sync', f'--user-data-dir={profile}', '--virtual-time-budget=5000',
             '--dump-dom', f'file://{page}'], stdout=subprocess.PIPE, stderr=subprocess.DEVNULL,
            env=os.environ | {'HOME': profile}, check=True, timeout=LIMIT).stdout.decode()


def section(document, report):
    """(headings of the columns, rows, notes) of one report; a chip's text stands in brackets."""
    text = re.search(rf'<section data-report="{report}">(.*?)</section>', document, re.DOTALL)[1]
    text = re.sub('<span class="chip">(.*?)</span>', r'[\1]', text)

    def cells(tag, inside):
        return [html.unescape(re.sub('<.*?>', '', cell))
                for cell in re.findall(f'<{tag}[ >][^>]*>?(.*?)</{tag}>', inside, re.DOTALL)]
    rows = [cells('td', row) for row in re.findall('<tr>(.*?)</tr>', text, re.DOTALL)]
    return cells('th', text), [row for row in rows if row], \
        re.findall('<p class="note">(.*?)</p>', text)


class Page(ProductTest):
    def make_page(self, shares, **keys):
        for share, files in shares.items():
            make_files(self.m.share(share), files)
        self.m.profile('weekly', **{'report_list': 'share_list,large_file'} | keys)
        folder = self.assertSucceeded(self.m.run('--report', 'weekly'), 'weekly')
        return folder / 'report.html'

    def test_names_are_shown_and_do_nothing(self):
        files = {name: 1500 - i for i, name in enumerate(NAMES)}
        page = self.make_page({'photos & more': files, 'big': {'f': 3 << 30}})
        document = show(page)
        folder = self.m.base / 'shares'
        columns, rows, notes = section(document, 'large_file')
        self.assertEqual((columns, notes), (['Share', 'File', 'Size'], []))
        self.assertEqual(rows[0], ['big', f'{folder}/big/f', '3\u00a0GiB'])
        self.assertEqual([row[1] for row in rows[1:]],
                         [f'{folder}/photos & more/{shown or name}'
                          for name, shown in NAMES.items()])
        columns, rows, _ = section(document, 'share_list')
        self.assertEqual(columns, ['Share', 'Volume', 'Size'])
        self.assertEqual([[row[0], row[2]] for row in rows],
                         [['big', '3\u00a0GiB'], ['photos & more', '13.1\u00a0KiB']])
        self.assertIn('title="3,221,225,472 bytes"', document)
        self.assertRegex(document, r'<title>Storage report \u2013 [\w.-]+</title>')
        self.assertNotIn('<img', document)
        self.assertNotRegex(page.read_text(), r'(src|href)=["\']?(https?:|//)')

    def test_damage_stays_in_its_section(self):
        whole = self.make_page({'photos': {f'{i}': 10 for i in range(201)}}).read_text()
        opening = "<script type='text/javascript'>\nvar {} = ["
        blocks = {name: re.search(re.escape(opening.format(name)) + '.*?\n];\n</script>\n', whole,
                                  re.DOTALL)[0]
                  for name in ('vornShareListData', 'vornLargeFileData')}
        share, large = blocks.values()
        damaged = 'The data of this report is damaged. The run\u2019s log says why.'
        missing = damaged.replace('damaged', 'missing')
        limit = 'The first 200 rows; the CSV file holds more.'
        for name, cut, replacement, expected in (
                ('first cut short', share, share[:-len("' ]\n];\n</script>\n")],
                 ([damaged], [limit])),
                ('bad row', "[ 'photos',", "[ 'photos', it's,", ([damaged], [limit])),
                ('column lost', re.search(r"'\d+' \]\n\];", share)[0], ']\n];',
                 ([damaged], [limit])),
                ('first missing', share, '', ([missing], [limit])),
                ('last empty', large, '</script>\n', ([], ['No rows']))):
            with self.subTest(name):
                page = self.m.base / 'page.html'
                page.write_text(self.finish_head(whole.replace(cut, replacement, 1)))
                document = show(page)
                self.assertEqual(tuple(section(document, report)[2]
                                       for report in ('share_list', 'large_file')), expected)
                for report, notes in zip(('share_list', 'large_file'), expected):
                    rows = section(document, report)[1]
                    self.assertEqual(len(rows), 0 if notes not in ([], [limit]) else
                                     {'share_list': 1, 'large_file': 200}[report])

    def finish_head(self, text):
        """The end of the head is what the template script makes of the blocks."""
        data = self.m.base / 'data'
        data.write_text(text.split('<meta name="vorn-empty-reports"')[0])
        script = self.m.stage / 'usr/vorn/vornreport/reportUI/build-template.sh'
        subprocess.run([script, 'header', data, 'share_list'], check=True)
        return data.read_text() + text.split('<body>\n')[1]


if __name__ == '__main__':
    unittest.main()
