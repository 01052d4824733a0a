"""Real engines of a fleet on loopback: each is a server of its own with folders of its own, and all
of them are the shards of the cluster "shards"."""
import asyncio
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


class Engine:
    """One server. `peers`: the ports of all shards for each other."""

    def __init__(self, folder, ports, peers):
        self.folder, (self.http, self.tcp, self.between) = Path(folder), ports
        self.process = None
        self.folder.mkdir()
        shards = ''.join(f'<shard><replica><host>127.0.0.1</host><port>{port}</port></replica></shard>'
                         for port in peers)
        (self.folder / 'config.xml').write_text(f'''<yandex>
<logger><level>warning</level><log>{self.folder}/log</log><errorlog>{self.folder}/errors</errorlog>
</logger><http_port>{self.http}</http_port><tcp_port>{self.tcp}</tcp_port>
<interserver_http_port>{self.between}</interserver_http_port>
<listen_host>127.0.0.1</listen_host><path>{self.folder}/data/</path>
<tmp_path>{self.folder}/tmp/</tmp_path><format_schema_path>{self.folder}/schemas/</format_schema_path>
<users_config>{self.folder}/users.xml</users_config><mark_cache_size>67108864</mark_cache_size>
<default_profile>default</default_profile><default_database>default</default_database>
<remote_servers><shards>{shards}</shards></remote_servers></yandex>''')
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
        with urllib.request.urlopen(f'{self.url}?{query}', sql.encode(), START) as answer:
            return answer.read().decode(errors='surrogateescape')

    def stop(self):
        if self.process is not None:
            self.process.kill()
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
    """Two started engines that are one cluster, for a test or a class of tests. `folders`: where
    they keep their data, if not in a folder of theirs."""

    def __init__(self, test, folders=(None, None)):
        base = tempfile.TemporaryDirectory(prefix='vorn-engine-', dir='/var/tmp')
        at_end = test.addClassCleanup if isinstance(test, type) else test.addCleanup
        at_end(base.cleanup)
        ports = free_ports(3 * len(folders))
        self.engines = [Engine(Path(folder or base.name, str(i)), ports[3 * i:3 * i + 3], ports[1::3])
                        for i, folder in enumerate(folders)]
        for engine in self.engines:
            at_end(engine.stop)
            engine.start()
        self.urls = ','.join(engine.url for engine in self.engines)

    def ask(self, sql, database='vornreport'):
        """What is inserted is in its place afterwards."""
        return self.engines[0].ask(sql, database, insert_distributed_sync=1)
