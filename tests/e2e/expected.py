"""What the reports must hold, computed from a tree: for tests that compare to the byte."""
import os
import time
import unittest

from harness import csv_field

MARK = b'\xef\xbb\xbf'
SCRIPT = b"<script type='text/javascript'>\n"
DAY = 86400


def text(value):
    return value if isinstance(value, bytes) else str(value).encode()


def quoted(value):
    """A quoted JavaScript string, of a value that only needs its quotes escaped."""
    return b"'" + text(value).replace(b"'", b"\\'") + b"'"


def block(variable, rows, before=b''):
    """The block of a report of quoted values."""
    if not rows:
        return b'</script>\n'
    rows = b',\n'.join(b'[ ' + b', '.join(map(quoted, row)) + b' ]' for row in rows)
    return SCRIPT + before + b'var ' + variable.encode() + b' = [\n' + rows + b'\n];\n</script>\n'


def csv(header, rows):
    return MARK + header.encode() + b'\n' + b''.join(
        b'\t'.join(csv_field(text(value)) for value in row) + b'\n' for row in rows)


def local_time(seconds):
    return time.strftime('%Y-%m-%d %H:%M:%S', time.localtime(seconds))


def data_blocks(folder):
    """All that the reports of a run appended to the page."""
    page = (folder / 'report.html').read_bytes()
    page = page.split(b'document.documentElement.lang = vornText.lang;\n</script>\n', 1)[1]
    return page.split(b'<meta name="vorn-empty-reports"')[0]


class Tree:
    """Files with owners and ages, as (share, path, size, time, owner, label of the type)."""

    def __init__(self, machine):
        self.machine = machine
        self.folders = {}
        self.files = []
        self._now = int(time.time())

    def add(self, share, name, content=b'', owner=None, days=30.0, label='other'):
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
        changed = self._now - int(days * DAY) - len(self.files)
        os.utime(path, (changed, changed))
        if owner is not None:
            os.chown(path, owner, -1)
        size = content if isinstance(content, int) else len(content)
        self.files.append((share, path, size, changed, os.stat(path).st_uid,
                           'reportUI_file_type_' + label))

    def share_paths(self):
        return (SCRIPT + b'var vornSharePath = {\n' + b',\n'.join(
            b'[' + quoted(share) + b'] : ' + quoted(folder)
            for share, folder in sorted(self.folders.items())) + b'\n};\n</script>\n')


def needs_root(test):
    """For tests of what a plain user's machine can't have; a server's, and the build's, must."""
    return unittest.skipIf(os.geteuid(), 'only root can give files away and mount')(test)


def totals(keys_and_sizes):
    """Key to (number, sum)."""
    result = {}
    for key, size in keys_and_sizes:
        count, total = result.get(key, (0, 0))
        result[key] = (count + 1, total + size)
    return result
