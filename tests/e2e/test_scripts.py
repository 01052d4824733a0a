"""The scripts, the manual, and who includes whom."""
import json
import os
import re
import subprocess
import tempfile
import unittest
from pathlib import Path

from harness import BUILD, FORMAT, ROOT

TEMPLATE = ROOT / 'reportUI/build-template.sh'


class Sources(unittest.TestCase):
    def test_shellcheck(self):
        scripts = []
        for folder, folders, names in os.walk(ROOT):
            folders[:] = [f for f in folders if not f.startswith((
                'build', '.git', 'quickstart-', 'node_modules'))]
            for path in (Path(folder, name) for name in names):
                if path.suffix in ('.sh', '.bash') or re.match(rb'#!/bin/(ba)?sh\b', path.read_bytes()):
                    scripts.append(path)
        self.assertGreater(len(scripts), 4)
        done = subprocess.run(['shellcheck', '-x', *scripts], cwd=ROOT, text=True,
                              stdout=subprocess.PIPE)
        self.assertEqual(done.stdout, '')


class Manual(unittest.TestCase):
    def test_every_report_is_described(self):
        manual = (ROOT / 'docs/man/vornreport.8').read_text()
        for report in FORMAT['reports']:
            self.assertIn(f'\n.It Cm {report["name"]}\n', manual)


# --- Who includes whom ---------------------------------------------------------------------------

# Where the includes of each part of the product are looked for, besides a file's own folder. A
# part's own folder is private unless it is called include.
SIGHT = {'src': 'include src platform/include report_format/include',
         'include': 'include platform/include report_format/include',
         'report_format': 'report_format/include platform/include platform/host/base/include',
         'platform/include': 'platform/include',
         'platform/host': 'platform/host platform/host/base/include platform/host/admin/include '
                          'platform/include report_format/include',
         'ctl': 'ctl platform/host/base/include platform/host/admin/include platform/include '
                'report_format/include'}
CONTRACTS = 'admin-contract format base-contract api'
PROGRAM = 'facts ground format api'
# Every room: its files, and the rooms whose headers it may name besides its own. Only such that
# stand further down, so that no arrow runs back up. What stands in brackets tells the files of a
# room apart: each report sees its own only.
ROOMS = {
    'main': (r'src/(?:fleet_)?main\.cpp', 'driver'),
    'registry': (r'src/vornreport/registry\.cpp', 'driver report ' + PROGRAM),
    'driver': (r'src/vornreport/.*|include/vornreport/registry\.hpp',
               'global gathering fleet history ' + PROGRAM),
    'global': (r'src/global\.cpp|include/vornreport/global\.hpp', 'report ' + PROGRAM),
    'report': (r'src/rep_([a-z_]+)[./].*', 'frame history ' + PROGRAM),
    'frame': (r'src/(?:report_frame|listed_report)\..*', PROGRAM),
    'gathering': (r'src/file_gathering/.*', PROGRAM),
    'fleet': (r'src/fleet/.*', 'history ' + PROGRAM),
    'history': (r'src/(?:history_db|db_volume_usage|db_snapshots)\..*', PROGRAM),
    'facts': (r'src/facts/.*', 'ground format api'),
    'ground': (r'src/(?:shell|below_share|error_log|fleet_rows|fleet_source|report_data|'
               r'signals_blocked|statements_ahead|thread_count)\..*|include/vornreport/.*', 'format api'),

    'ctl-main': (r'ctl/main\.cpp', 'doctor ctl-fleet run config schedule ctl-base ' + CONTRACTS),
    'doctor': (r'ctl/doctor/.*', 'run config schedule ctl-base ' + CONTRACTS),
    'ctl-fleet': (r'ctl/fleet/.*', 'run config ctl-base ' + CONTRACTS),
    'run': (r'ctl/run/.*', 'schedule ctl-base ' + CONTRACTS),
    'config': (r'ctl/config/.*', 'schedule ctl-base ' + CONTRACTS),
    'schedule': (r'ctl/schedule/.*', 'ctl-base ' + CONTRACTS),
    'ctl-base': (r'ctl/base/.*', CONTRACTS),

    'admin': (r'platform/host/admin/(?!include/).*',
              'host-fleet host-outcome host-schedule host-mail host-run host-machine host-config '
              'host-base ' + CONTRACTS),
    'admin-contract': (r'platform/host/admin/include/.*', 'format'),
    'host-fleet': (r'platform/host/fleet/.*', 'host-outcome host-run host-config host-base format '
                   'base-contract api'),
    'host-outcome': (r'platform/host/outcome/.*', 'host-schedule host-mail host-run host-config '
                     'host-base format base-contract api'),
    'host-schedule': (r'platform/host/schedule/.*', 'host-config host-base base-contract api'),
    'host-mail': (r'platform/host/mail/.*', 'host-config host-base format base-contract api'),
    'host-run': (r'platform/host/run/.*', 'host-config host-base format base-contract api'),
    'host-machine': (r'platform/host/machine/.*', 'host-config host-base format base-contract api'),
    'host-config': (r'platform/host/config/.*', 'host-base format base-contract api'),
    'host-base': (r'platform/host/base/(?!include/).*', 'base-contract api'),
    'format': (r'report_format/.*', 'base-contract api'),
    'base-contract': (r'platform/host/base/include/.*', 'api'),
    'api': (r'platform/include/.*', '')}


def room_of(path):
    """The first room that `path` belongs to, and what tells it apart there; None when it has none."""
    for room, (files, _) in ROOMS.items():
        if match := re.fullmatch(files, path):
            return room, match.groups()
    return None


def sight_of(path):
    return max((part for part in SIGHT if path.startswith(part + '/')), key=len, default=None)


class Includes(unittest.TestCase):
    def sources(self):
        """All but the tests and benchmarks, which look into everything."""
        for folder, folders, names in os.walk(ROOT):
            folders[:] = [name for name in folders if not name.startswith((
                'build', '.', 'quickstart-', 'node_modules')) and not (
                    Path(folder) == ROOT and name in ('tests', 'bench'))]
            for name in names:
                if re.search(r'\.(c|cc|cpp|h|hpp)$', name):
                    yield str(Path(folder, name).relative_to(ROOT))

    def test_rooms_name_only_what_stands_below(self):
        order = list(ROOMS)
        for room, (_, below) in ROOMS.items():
            for other in below.split():
                self.assertLess(order.index(room), order.index(other), f'{room} names {other}')

    def test_includes_go_one_way(self):
        count = 0
        for path in self.sources():
            self.assertTrue(room_of(path), f'{path} belongs to no room')
            room, _ = own = room_of(path)
            sight = SIGHT[sight_of(path)].split()
            for open_, name in re.findall(r'^\s*#\s*include\s*(["<])(.*)[">]',
                                          (ROOT / path).read_text(), re.MULTILINE):
                places = [Path(path).parent, *sight] if open_ == '"' else sight
                found = [os.path.normpath(Path(place, name)) for place in places
                         if (ROOT / place / name).is_file()]
                self.assertTrue(found or open_ == '<', f'{path} names {name}, out of its sight')
                for target in found[:1]:
                    count += 1
                    named = room_of(target)
                    self.assertTrue(named == own or named[0] in ROOMS[room][1].split(),
                                    f'{path} ({room}) names {target} ({named[0]})')
        self.assertGreater(count, 500)

    def test_targets_see_no_more(self):
        commands = json.loads((BUILD / 'compile_commands.json').read_text())
        seen = set()
        for command in commands:
            path = os.path.relpath(command['file'], ROOT)
            part = sight_of(path)
            if part and ' -o tests/' not in command['command']:
                folders = {os.path.relpath(folder, ROOT)
                           for folder in re.findall(r'-I(\S+)', command['command'])}
                self.assertLessEqual(folders, set(SIGHT[part].split()), path)
                seen.add(part)
        self.assertEqual(seen, {'src', 'report_format', 'platform/host', 'ctl'})


class Template(unittest.TestCase):
    def test_calls_that_must_not_make_a_page(self):
        cut = '<main>\ncut sho'
        for arguments, status, before, after in (
                # What can't be understood is not done.
                ('', 2, None, None), ('header', 2, None, None), ('unheard FILE', 2, None, None),
                ('lang FILE', 2, None, None), ('tail FILE x', 2, None, None),
                ("lang FILE x';alert(1)", 2, None, None), ('body FILE <b>', 2, None, None),
                ('header FILE a b', 2, None, None),
                # Parts that are not there.
                ('lang FILE en', 1, None, None), ('header FILE x', 1, None, None),
                ('body FILE x', 1, None, None), ('tail FILE', 1, None, None),
                # The page itself is emptied: what is added to it must never make it look whole.
                ('body FILE x', 1, cut, cut), ('tail FILE', 1, cut, cut), ('lang FILE en', 1, cut, ''),
                # Links are not followed.
                *((f'{command} FILE', 1, 'link', None) for command in ('header', 'body', 'tail'))):
            with self.subTest(arguments, before=before), tempfile.TemporaryDirectory() as folder:
                file = Path(folder, 'part')
                if before == 'link':
                    file.symlink_to(Path(folder, 'elsewhere'))
                elif before is not None:
                    file.write_text(before)
                done = subprocess.run([TEMPLATE, *arguments.replace('FILE', str(file)).split()],
                                      text=True, capture_output=True)
                self.assertEqual(done.returncode, status)
                self.assertEqual('\nusage: ' in done.stderr, status == 2)
                self.assertEqual(file.read_text() if file.exists() else None, after)
