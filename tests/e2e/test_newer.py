"""A fleet on one node of a newer release: all of the product's statements, by the engine's embedded
library."""
import filecmp
import shutil
import subprocess
import tempfile
import unittest
from pathlib import Path

import test_fleet
from engine import Engine
from harness import BUILD

SOURCE = Path(__file__).with_name('newer')
PACKAGES = BUILD / 'newer_engine'


def install():
    lock = PACKAGES / 'package-lock.json'
    if not lock.exists() or not filecmp.cmp(SOURCE / lock.name, lock, shallow=False):
        shutil.rmtree(PACKAGES, ignore_errors=True)
        PACKAGES.mkdir()
        for name in ('package.json', '.npmrc'):
            shutil.copy(SOURCE / name, PACKAGES)
        shutil.copy(SOURCE / lock.name, PACKAGES)
        try:
            # Not "ci": the lock holds no libraries of other platforms, which it would miss.
            subprocess.run(['npm', 'install', '--no-save', '--silent', '--ignore-scripts'],
                           cwd=PACKAGES, check=True)
        except BaseException:
            lock.unlink()
            raise


class Node:
    """An engine that is a cluster of one."""
    ask_on_node = Engine.ask

    def __init__(self, test):
        base = tempfile.TemporaryDirectory(prefix='vorn-engine-', dir='/var/tmp')
        test.addClassCleanup(base.cleanup)
        process = subprocess.Popen(['node', SOURCE / 'engine.mjs', PACKAGES, base.name],
                                   stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, text=True)
        test.addClassCleanup(process.stdout.close)
        test.addClassCleanup(process.wait)
        test.addClassCleanup(process.kill)
        self.urls = self.url = f'http://127.0.0.1:{int(process.stdout.readline())}/'
        self.engines = [self]

    def ask(self, sql, database='vornreport'):
        return self.ask_on_node(sql, database, insert_distributed_sync=1)


class Newer(test_fleet.AnyFleet, test_fleet.FleetTest):
    @classmethod
    def make_engines(cls):
        install()
        return Node(cls)


if __name__ == '__main__':
    unittest.main()
