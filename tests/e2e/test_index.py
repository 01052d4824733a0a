"""File indexes of shares: databases that anybody may have written."""
import os
import signal
import sqlite3
import struct
import time

from expected import DAY, csv, data_rows, facts
from harness import ProductTest, make_files

PAGE = 4096
COLUMNS = ('owner_name', 'time_modify', 'size', 'path', 'name', 'file_ext', 'is_dir')
ROW = ('ann', '1700000000', '10', 'a.txt', 'a.txt', 'txt', 0)


def make_index(path, rows=(ROW, ROW), script=''):
    with sqlite3.connect(path) as db:
        db.execute(f'CREATE TABLE file_info ({", ".join(COLUMNS)})')
        db.executemany(f'INSERT INTO file_info VALUES ({", ".join("?" * 7)})', rows)
        db.executescript(f'BEGIN; {script}; COMMIT')
    db.close()


def changed(**values):
    """The row with other values."""
    return tuple(values.get(column, value) for column, value in zip(COLUMNS, ROW))


def hostile_journal(victim):
    """One that SQLite plays back; then it removes the super-journal that the journal names."""
    magic, name = bytes.fromhex('d9d505f920a163d7'), os.fsencode(victim)
    header = magic + struct.pack('>5I', 0, 0, 2, 512, PAGE)
    lock_page = (1 << 30) // PAGE + 1
    return header.ljust(512, b'\0') + struct.pack('>I', lock_page) + name + struct.pack(
        '>2I', len(name), sum(name)) + magic


TABLE = 'ALTER TABLE file_info RENAME TO real; '
SELECT = f'SELECT {", ".join(COLUMNS)} FROM real'
# Name to a script that runs on an index in order, and what is said of it then.
SCHEMAS = {
    'view': (f'{TABLE} CREATE VIEW file_info AS {SELECT}', 'access to view "file_info" prohibited'),
    'endless': (f'{TABLE} CREATE VIEW file_info AS WITH RECURSIVE n(x) AS (SELECT 1 UNION ALL '
                f'SELECT x FROM n) {SELECT}, n', 'no such table'),
    'virtual': (f'{TABLE} CREATE VIRTUAL TABLE file_info USING fts4({", ".join(COLUMNS)})',
                'no such module: fts4'),
    'generated': ('ALTER TABLE file_info DROP path; ALTER TABLE file_info ADD path AS (name)',
                  'its column path is generated'),
    'less': ('ALTER TABLE file_info DROP COLUMN file_ext', 'no such column: file_ext'),
    'crowd': (''.join(f'CREATE TABLE t{i} (a);' for i in range(300)),
              'its schema has too many entries'),
    'none': ('DROP TABLE file_info', 'no such table: file_info')}
# Name to what is unusual in the last of three rows, and what is said of it.
ROWS = {
    'up': ({'path': 'x/../../y'}, 'its path holds ".."'),
    'dots': ({'path': '..'}, 'its path holds'),
    'ghost': ({'owner_name': 'ghost'}, 'its owner "ghost" is no account'),
    'nobody': ({'owner_name': None}, 'it has no owner_name'),
    'unnamed': ({'owner_name': ''}, 'its owner "" is no account'),
    'pathless': ({'path': None}, 'it has no path'),
    'zero': ({'path': 'a\0b'}, 'its path holds a zero byte'),
    'long': ({'name': 'n' * 256}, 'its name is longer than 255 bytes'),
    'kind': ({'file_ext': 'a\0b'}, 'its file_ext holds a zero byte'),
    'negative': ({'size': -1}, 'its size is no number'),
    'huge': ({'size': str(1 << 63)}, 'its size is no number'),
    'when': ({'time_modify': 'now'}, 'its time_modify is no number')}


class Indexes(ProductTest):
    def setUp(self):
        super().setUp()
        self.m.accounts({'root': 0, 'ann': 3001})
        self.wanted = {}  # share to what is said of its index

    def add(self, name, **content):
        """A share of one file, with an index of two; the index's path."""
        make_files(self.m.share(name), {'walked': 7})
        folder = self.m.base / 'indexes' / name
        folder.mkdir(parents=True)
        with self.m.shares.open('a') as file:
            file.write(f'file_index = {folder}/index.db\n')
        make_index(folder / 'index.db', **content)
        return folder / 'index.db'

    def report(self):
        """What was said of each share's index by log and facts, and the report's folder."""
        self.m.profile('p', report_list='share_list,large_file')
        run = self.m.run('--report', 'p')
        self.assertEqual((run.status, self.m.status('p'), self.m.leftovers()), (0, 'success', []))
        folder, = self.m.report_folders('p')
        told = {each['what']: each['text'] for each in facts(folder)['incidents']}
        self.assertEqual({each['kind'] for each in facts(folder)['incidents']}, {'index_refused'})
        self.assertEqual([line.rstrip() for line in run.log_lines],
                         [line.replace('were walked', 'are walked').replace(
                             'the file index of share ' + name, f'share "{name}": its file index '
                             f'{self.m.base}/indexes/{name}/index.db')
                          for name, line in told.items()])
        return told, folder

    def test_only_what_is_in_order_is_used(self):
        good = self.add('good', rows=(
            changed(path="it's/" + "'" * 3, name="'" * 3, size=5000),
            changed(path='l' * 5000, size='4000'), changed(name=None, file_ext=None, size=3000.5),
            changed(path=b'bytes\xff', size=2000), changed(size=None, time_modify=None),
            changed(path='..a/b..', size=1), changed(owner_name='ghost', path='..', is_dir=1)),
            script='CREATE INDEX i ON file_info (is_dir, path); CREATE VIEW v AS SELECT 1')
        with good.open('r+b') as file:  # in the mode WAL, as it is after a clean end
            file.seek(18)
            file.write(b'\2\2')
        for name, (script, reason) in SCHEMAS.items():
            self.spoil(name, reason, script=script)
        for name, (values, reason) in ROWS.items():
            self.spoil(name, reason, rows=(ROW, ROW, changed(**values)))
        victim = self.m.base / 'victim'
        victim.write_text('precious')
        self.spoil_files(victim)
        told, folder = self.report()
        self.assertEqual(set(told), set(self.wanted))
        for name, reason in self.wanted.items():
            self.assertIn(reason, told[name], name)
        self.assertEqual(victim.read_text(), 'precious')
        page = (folder / 'report.html').read_text(errors='surrogateescape')
        self.assertEqual({row.split("'")[1]: row.split("'")[5] for row in data_rows(
            page, 'vornShareListData')}, {'good': '14001'} | dict.fromkeys(self.wanted, '7'))
        top = str(self.m.base / 'shares/good')
        rows = [("it's/'''", 5000), ('l' * (4094 - len(top)), 4000), ('a.txt', 3000),
                ('bytes\udcff', 2000), ('..a/b..', 1), ('a.txt', 0)]
        lines = (folder / 'csv/large_file.csv').read_bytes().splitlines()
        self.assertEqual(
            [line for line in lines if line.startswith(b'"good"')],
            csv('', [('good', f'{top}/{name}', size) for name, size in rows]).splitlines()[1:])

    def spoil(self, name, reason, **content):
        self.wanted[name] = reason
        return self.add(name, **content)

    def spoil_files(self, victim):
        self.spoil('journal', 'index.db-journal is not empty').with_name(
            'index.db-journal').write_bytes(hostile_journal(victim))
        self.spoil('wal', 'index.db-wal is not empty').with_name('index.db-wal').write_text('x')
        path = self.spoil('link', 'is no regular file')
        path.rename(path.with_name('real.db'))
        path.symlink_to('real.db')
        path = self.spoil('pipe', 'is no regular file')
        path.unlink()
        os.mkfifo(path)
        self.spoil('text', 'file is not a database').write_bytes(b'not one' * 1000)
        path = self.spoil('cut', 'malformed', rows=(ROW,) * 1000)
        os.truncate(path, 2 * PAGE)
        with self.spoil('sparse', 'larger than').open('r+b') as file:
            file.truncate(1 << 43)
        # A tree whose root has the same leaf many times lists more than there is.
        path = self.spoil('again', 'gives more than', rows=(ROW,) * 50)
        self.lead_round(path)

    def lead_round(self, path):
        """Gives the table's leaf another root, which has it as its child 500 times."""
        data = bytearray(path.read_bytes())
        leaf = bytes(data[PAGE:2 * PAGE])
        cells = 500
        start = PAGE - 5 * cells
        root = struct.pack('>BHHHBI', 5, 0, cells, start, 0, 3)
        root += b''.join(struct.pack('>H', start + 5 * i) for i in range(cells))
        root = root.ljust(start, b'\0') + struct.pack('>IB', 3, 1) * cells
        data[28:32] = struct.pack('>I', 3)
        path.write_bytes(data[:PAGE] + root + leaf)

    def test_its_folders_and_ages_are_those_of_a_walk(self):
        walked, now, rows = self.m.share('walked'), int(time.time()), []
        for i, (name, days) in enumerate({
                '1': 3, 'a/b/2': 10, 'a/' + 'n' * 255 + '/' + 'x' * 255: 50, 'a.b/3': 200,
                "a/it's\\\n/4": 500, 'a/b.c/5': 1500, 'a/b/6': 9999, 'z/7': -9}.items()):
            make_files(walked, {name: 100 + i * i})
            os.utime(walked / name, (now - days * DAY,) * 2)
            rows.append(changed(path=name, name=name.split('/')[-1], size=100 + i * i,
                                time_modify=now - days * DAY))
        self.add('indexed', rows=rows)
        self.m.profile('p', report_list='folder_usage,file_age')
        self.assertSucceeded(self.m.run('--report', 'p'), 'p')
        for report, count in (('folder_usage', 8), ('file_age', 8)):
            lines = (self.m.report_folders('p')[0] / f'csv/{report}.csv').read_bytes().split(b'\n')
            found = {share: sorted(line.split(b'\t', 1)[1] for line in lines if line.startswith(
                share)) for share in (b'"walked"', b'"indexed"')}
            self.assertEqual(found[b'"walked"'], found[b'"indexed"'])
            self.assertEqual(len(found[b'"walked"']), count, found)

    def test_nothing_of_one_outlives_the_run(self):
        self.add('good')
        self.m.profile('p', report_list='share_list')
        self.m.stop_at('body 2')
        run = self.m.start('--report', 'p')
        program, _ = run.pid(), self.m.stopped_pid()
        self.assertTrue((self.m.vorn / 'var/stat/p/index.db').exists())
        os.kill(program, signal.SIGTERM)
        run.finish()
        self.m.go_on()
        self.assertEqual([path for path in self.m.leftovers() if 'reports' not in path.parts], [])
