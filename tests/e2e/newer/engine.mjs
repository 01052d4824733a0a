// A newer release of the fleet's engine, as far as a fleet needs it: its embedded library behind the
// engine's HTTP interface. engine.mjs PACKAGES FOLDER: the folder with node_modules, and one for
// its data; prints the port.
import fs from 'node:fs';
import http from 'node:http';
import { createRequire } from 'node:module';
import path from 'node:path';
import zlib from 'node:zlib';

const [packages, folder] = process.argv.slice(2);
const { Session } = createRequire(path.join(packages, 'package.json'))('chdb');
// It is its cluster's one node: nobody listens at the port, by which it knows itself.
const config = path.join(folder, 'config.xml');
fs.writeFileSync(
  config,
  `<clickhouse><tcp_port>9000</tcp_port><remote_servers><shards><shard><replica>
   <host>127.0.0.1</host><port>9000</port></replica></shard></shards></remote_servers></clickhouse>`,
);
const session = new Session(path.join(folder, 'data'), {
  connectionArgs: [`--config-file=${config}`],
});
const rows = path.join(folder, 'rows');

// What the interface takes for itself; all else in a query are settings, which must be known.
const own = new Set(['query', 'database', 'default_format', 'wait_end_of_query', 'buffer_size']);
const literal = (text) => `'${text.replace(/['\\]/g, '\\$&')}'`;

async function answer(query, body) {
  const settings = [...query].filter(([key]) => !own.has(key));
  for (const statement of [
    `use \`${query.get('database')}\``,
    ...settings.map(([key, value]) => `set ${key} = ${literal(value)}`),
  ]) {
    await session.queryAsync(statement);
  }
  if (!query.has('query')) {
    const result = await session.queryAsync(body.toString(), { format: 'TabSeparated' });
    return Buffer.from(result.bytes());
  }
  fs.writeFileSync(rows, body);
  await session.queryAsync(
    query.get('query').replace(/ FORMAT (\w+)$/, ` from infile ${literal(rows)} FORMAT $1`),
  );
  return Buffer.alloc(0);
}

async function serve(request, response) {
  const parts = [];
  for await (const part of request) {
    parts.push(part);
  }
  const sent = Buffer.concat(parts);
  const body = request.headers['content-encoding'] === 'gzip' ? zlib.gunzipSync(sent) : sent;
  const { searchParams } = new URL(request.url, 'http://engine');
  try {
    const text = await answer(searchParams, body);
    const accepted = request.headers['accept-encoding'] ?? '';
    if (searchParams.get('enable_http_compression') === '1' && accepted.includes('gzip')) {
      response.writeHead(200, { 'Content-Encoding': 'gzip' }).end(zlib.gzipSync(text));
    } else {
      response.end(text);
    }
  } catch (error) {
    response
      .writeHead(500, { 'X-ClickHouse-Exception-Code': error.clickhouseCode ?? 0 })
      .end(`${error.message}\n`);
  }
}

// A session does one thing at a time.
let last = Promise.resolve();
const server = http.createServer((request, response) => {
  last = last.then(() => serve(request, response)).catch((error) => response.destroy(error));
});
server.listen(0, '127.0.0.1', () => console.log(server.address().port));
