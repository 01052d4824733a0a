"""Real engines of a fleet on loopback: each is a server of its own with folders of its own, and all
of them are one cluster, whose replicas a ZooKeeper coordinates."""
import asyncio
import contextlib
import socket
import subprocess
import tempfile
import threading
import time
import urllib.error
import urllib.parse
import urllib.request
from pathlib import Path

START = 60  # seconds that no start comes near
PASSWORD = "s'ecret \\ \"1"


def free_ports(count):
    sockets = [socket.socket() for _ in range(count)]
    for one in sockets:
        one.bind(('127.0.0.1', 0))
    ports = [one.getsockname()[1] for one in sockets]
    for one in sockets:
        one.close()
    return ports


def text(value):
    return str(value).replace('&', '&amp;').replace('<', '&lt;')


def cluster(name, shards):
    """A cluster of remote_servers. `shards`: the ports of each one's replicas."""
    return f'<{name}>' + ''.join('<shard><internal_replication>true</internal_replication>' + ''.join(
        f'<replica><host>127.0.0.1</host><port>{port}</port></replica>' for port in replicas) +
        '</shard>' for replicas in shards) + f'</{name}>'


class Coordinator:
    """A ZooKeeper, by which replicas find each other."""

    def __init__(self, folder):
        self.folder, (self.port,) = Path(folder), free_ports(1)
        self.process = None
        self.folder.mkdir()
        (self.folder / 'zoo.cfg').write_text(
            f'tickTime=500\ndataDir={self.folder}/data\nclientPort={self.port}\n'
            'clientPortAddress=127.0.0.1\nadmin.enableServer=false\n4lw.commands.whitelist=ruok\n')

    def start(self):
        self.process = subprocess.Popen(
            ['java', '-Xmx128m', '-XX:+UseSerialGC', '-XX:TieredStopAtLevel=1',
             '-cp', '/usr/share/java/zookeeper.jar',
             'org.apache.zookeeper.server.quorum.QuorumPeerMain', self.folder / 'zoo.cfg'],
            stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
        end = time.monotonic() + START
        while time.monotonic() < end and self.process.poll() is None:
            with contextlib.suppress(OSError), socket.create_connection(
                    ('127.0.0.1', self.port), START) as way:
                way.sendall(b'ruok')
                if way.recv(4) == b'imok':
                    return
            time.sleep(0.05)
        raise AssertionError('ZooKeeper does not start')

    def stop(self):
        if self.process is not None:
            self.process.kill()
            self.process.wait()
            self.process = None

    def text(self, shard, replica):
        """What a replica is told of it."""
        return (f'<zookeeper><node><host>127.0.0.1</host><port>{self.port}</port></node>'
                '<session_timeout_ms>3000</session_timeout_ms></zookeeper>'
                '<interserver_http_host>127.0.0.1</interserver_http_host><merge_tree>'
                '<zookeeper_session_expiration_check_period>1'
                '</zookeeper_session_expiration_check_period></merge_tree>'
                f'<macros><shard>{shard}</shard><replica>{replica}</replica></macros>')


class Engine:
    """One server. `clusters`: the inside of remote_servers; `more`: of its configuration."""

    def __init__(self, folder, ports, clusters, more=''):
        self.folder, (self.http, self.tcp, self.between) = Path(folder), ports
        self.process = None
        self.folder.mkdir()
        (self.folder / 'config.xml').write_text(f'''<yandex>
<logger><level>warning</level><log>{self.folder}/log</log><errorlog>{self.folder}/errors</errorlog>
</logger><http_port>{self.http}</http_port><tcp_port>{self.tcp}</tcp_port>
<interserver_http_port>{self.between}</interserver_http_port>
<listen_host>127.0.0.1</listen_host><path>{self.folder}/data/</path>
<tmp_path>{self.folder}/tmp/</tmp_path><format_schema_path>{self.folder}/schemas/</format_schema_path>
<users_config>{self.folder}/users.xml</users_config><mark_cache_size>67108864</mark_cache_size>
<default_profile>default</default_profile><default_database>default</default_database>
<remote_servers>{clusters}</remote_servers>{more}</yandex>''')
        (self.folder / 'users.xml').write_text(f'''<yandex><profiles><default>
<max_memory_usage>4000000000</max_memory_usage></default></profiles><quotas><default/></quotas>
<users><default><password></password><networks><ip>127.0.0.1</ip></networks>
<profile>default</profile><quota>default</quota></default>
<careful><password>{text(PASSWORD)}</password><networks><ip>127.0.0.1</ip></networks>
<profile>default</profile><quota>default</quota></careful></users></yandex>''')
        self.url = f'http://127.0.0.1:{self.http}/'

    def start(self, prefix=()):
        self.process = subprocess.Popen(
            [*prefix, 'clickhouse-server', f'--config-file={self.folder}/config.xml'],
            cwd=self.folder, stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL,
            stderr=subprocess.DEVNULL)
        end = time.monotonic() + START
        while True:
            try:
                if self.ask('select 1') == '1\n':
                    return self
            except (urllib.error.URLError, OSError) as error:
                if self.process.poll() is not None or time.monotonic() > end:
                    raise AssertionError((self.folder / 'errors').read_text()) from error
            time.sleep(0.05)

    def ask(self, sql, database='default', **settings):
        query = urllib.parse.urlencode({'database': database} | settings)
        try:
            with urllib.request.urlopen(f'{self.url}?{query}', sql.encode(), START) as answer:
                return answer.read().decode(errors='surrogateescape')
        except urllib.error.HTTPError as error:
            raise AssertionError(error.read().decode(errors='replace')) from error

    def stop(self, softly=False):
        """`softly`: it takes its leave of others, which don't wait for it then."""
        if self.process is not None:
            (self.process.terminate if softly else self.process.kill)()
            self.process.wait()
            self.process = None


class Relay:
    """A way to an engine, with TLS where `tls` is a context for it: each connection waits `delay`
    seconds for its first answer, and the first one ends after `cut` bytes of what is sent."""

    def __init__(self, test, engine, tls=None, delay=0, cut=None):
        self.engine, self.delay, self.cut = engine, delay, cut
        loop = asyncio.new_event_loop()
        server = loop.run_until_complete(asyncio.start_server(self.pass_on, '127.0.0.1', 0, ssl=tls))
        self.port = server.sockets[0].getsockname()[1]
        thread = threading.Thread(target=loop.run_forever)
        thread.start()
        for end in (loop.close, server.close, thread.join):
            test.addCleanup(end)
        test.addCleanup(loop.call_soon_threadsafe, loop.stop)

    async def pass_on(self, reader, writer):
        there, back = await asyncio.open_connection('127.0.0.1', self.engine.http)
        cut, self.cut = self.cut, None

        async def copy(source, target, delay=0, most=1 << 40):
            while data := await source.read(min(most, 1 << 16)):
                await asyncio.sleep(delay)
                target.write(data)
                await target.drain()
                delay, most = 0, most - len(data)
        ways = [asyncio.ensure_future(way) for way in (copy(reader, back, 0, cut or 1 << 40),
                                                       copy(there, writer, self.delay))]
        await asyncio.wait(ways, return_when=asyncio.FIRST_COMPLETED)
        writer.close()
        back.close()
        await asyncio.gather(*ways, return_exceptions=True)


class Shards:
    """Started engines that are one cluster of two shards, for a test or a class of tests.
    `folders`: where they keep their data, if not in a folder of theirs; `replicas`: how many each
    shard has."""

    def __init__(self, test, folders=(None, None), replicas=1):
        base = tempfile.TemporaryDirectory(prefix='vorn-engine-', dir='/var/tmp')
        at_end = test.addClassCleanup if isinstance(test, type) else test.addCleanup
        at_end(base.cleanup)
        folders = [folder for folder in folders for _ in range(replicas)]
        ports = free_ports(3 * len(folders))
        nodes = ports[1::3]
        shards = cluster('shards', [nodes[i:i + replicas] for i in range(0, len(nodes), replicas)])
        more = [''] * len(folders)
        if replicas > 1:
            self.coordinator = Coordinator(Path(base.name, 'coordinator'))
            at_end(self.coordinator.stop)
            self.coordinator.start()
            more = [self.coordinator.text(i // replicas, i) for i in range(len(folders))]
        self.engines = [Engine(Path(folder or base.name, str(i)), ports[3 * i:3 * i + 3], shards,
                               more[i]) for i, folder in enumerate(folders)]
        for engine in self.engines:
            at_end(engine.stop)
            engine.start()
        self.urls = ','.join(engine.url for engine in self.engines)

    def ask(self, sql, database='vornreport'):
        """What is inserted is in its place afterwards."""
        return self.engines[0].ask(sql, database, insert_distributed_sync=1)
