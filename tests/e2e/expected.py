"""What the reports must hold, computed from a tree: for tests that compare to the byte."""
import hashlib
import json
import os
import re
import time

MARK = b'\xef\xbb\xbf'
SCRIPT = b"<script type='text/javascript'>\n"
DAY = 86400


def quoted(value):
    """A quoted JavaScript string. A byte that is no UTF-8 is a lone surrogate in it, and a text of
    more than 8191 bytes ends in a mark and the beginning of its digest."""
    def escape(match):
        plain = {'\n': r'\n', '\t': r'\t', "'": r"\'", '\\': r'\\'}
        return plain.get(match[0]) or f'\\u{ord(match[0]):04x}'
    pieces = [re.sub('[\n\t\x01\'\\\\<\u202e\udc80-\udcff]', escape, c) for c in str(value)]
    end = ''
    while len(''.join(pieces).encode()) > 8191 - len(end.encode()):
        end = end or '…' + hashlib.sha256(os.fsencode(value)).hexdigest()[:16]
        pieces.pop()
    return "'" + ''.join(pieces) + end + "'"


def block(variable, rows, before=''):
    """The block of a report of quoted values."""
    if not rows:
        return b'</script>\n'
    rows = ',\n'.join('[ ' + ', '.join(map(quoted, row)) + ' ]' for row in rows)
    return SCRIPT + f'{before}var {variable} = [\n{rows}\n];\n</script>\n'.encode()


def csv_line(row):
    return b'\t'.join(b'"' + re.sub(rb'[\n\t]', b' ', os.fsencode(str(value))).replace(b'"', b'""')
                      + b'"' for value in row)


def csv(header, rows):
    return MARK + header.encode() + b'\n' + b''.join(csv_line(row) + b'\n' for row in rows)


def local_time(seconds):
    return time.strftime('%Y-%m-%d %H:%M:%S', time.localtime(seconds))


FACTS = SCRIPT + b'var vornFacts = '


def data_blocks(folder):
    """All that the reports of a run appended to the page, without the facts behind it."""
    page = (folder / 'report.html').read_bytes()
    page = re.split(rb"\nvar vornLang = '[\w-]+';\n</script>\n", page, maxsplit=1)[1]
    return page.split(b'</template>\n</head>\n')[0].split(FACTS)[0]


def facts(folder):
    """The facts of a report, which stand in two places alike."""
    text = (folder / 'report.json').read_bytes()
    page = (folder / 'report.html').read_bytes()
    block = page.split(FACTS)[1].split(b';\n</script>\n')[0]
    assert block + b'\n' == text and b'<' not in text and text.isascii(), text
    return json.loads(text)


def data_rows(page, variable):
    """The lines of a report's rows in a page, or what is left of it."""
    found = re.search(f'\nvar {variable} = \\[\n(.*?)\n\\];\n', page, re.DOTALL)
    return found[1].split('\n') if found else []


class Tree:
    """Files with owners and ages, as (share, path, size, time, owner, label of the type)."""

    def __init__(self, machine):
        self.machine = machine
        self.folders = {}
        self.files = []
        self.now = int(time.time())

    def add(self, share, name, content=b'', label='other', owner=None, days=30.0):
        """`content` is the file's bytes or its size; the file is `days` old. Only root can name
        an owner."""
        if share not in self.folders:
            self.folders[share] = self.machine.share(share)
        path = os.path.join(self.folders[share], name)
        os.makedirs(os.path.dirname(path), exist_ok=True)
        with open(path, 'wb') as file:
            if isinstance(content, int):
                file.truncate(content)
            else:
                file.write(content)
        # Each file has a time of its own, so that the order of times is clear.
        changed = self.now - int(days * DAY) - len(self.files)
        os.utime(path, (changed, changed))
        if owner is not None:
            os.chown(path, owner, -1)
        size = content if isinstance(content, int) else len(content)
        self.files.append((share, path, size, changed, os.stat(path).st_uid,
                           'reportUI_file_type_' + label))

    def share_paths(self):
        return SCRIPT + ('var vornSharePath = {\n' + ',\n'.join(
            f'[{quoted(share)}] : {quoted(folder)}'
            for share, folder in sorted(self.folders.items())) + '\n};\n</script>\n').encode()


def totals(keys_and_sizes):
    """Key to (number, sum)."""
    result = {}
    for key, size in keys_and_sizes:
        count, total = result.get(key, (0, 0))
        result[key] = (count + 1, total + size)
    return result
