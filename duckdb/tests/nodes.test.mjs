// read_tav: a row for each node, as `tav json --lines` tells them.
import assert from 'node:assert/strict';
import {spawnSync} from 'node:child_process';
import {readFileSync, truncateSync, writeFileSync} from 'node:fs';
import {join} from 'node:path';
import {test} from 'node:test';

import {folder, golden, goldenNames, make, open, program, root, rows, same, tav, value} from './engine.mjs';

const work = folder();
const connection = await open();

/** The nodes of a file as the program tells them, as a query. */
function told(file)
{
  const lines = join(work, 'lines.json');
  writeFileSync(lines, program('tools/tav', ['json', '--lines', file]));
  const columns = `{"path": 'VARCHAR', "offset": 'UBIGINT', "depth": 'UINTEGER', "id": 'USMALLINT', "type": 'VARCHAR',
                    "size": 'VARCHAR', "element": 'VARCHAR', "value": 'JSON', "bytes": 'VARCHAR'}`;
  return `SELECT path, "offset", depth, id, type, size, element, json_extract_string(value, '$') AS value, bytes
          FROM read_json('${lines}', format = 'newline_delimited', columns = ${columns})
          WHERE id IS NOT NULL AND id < 65000`;
}

const words = `type LIKE '%int%' AND type NOT LIKE '%array' OR type LIKE '%String'`;

/** Both have the same nodes in the same places, and the same names, numbers, texts, bytes and times. */
async function agree(file, options = '')
{
  await connection.run(`CREATE OR REPLACE TEMP TABLE own AS FROM read_tav('${file}', on_damage := 'skip'${options})`);
  await connection.run(`CREATE OR REPLACE TEMP TABLE told AS ${told(file)}`);
  const all = 'path, "offset", depth, id, type';
  const count = await same(connection, `SELECT ${all} FROM own`, `SELECT ${all} FROM told`);
  await same(connection, `SELECT "offset", coalesce(number::VARCHAR, text) AS value FROM own
                          WHERE (${words}) AND bytes IS NULL`,
             `SELECT "offset", value FROM told WHERE (${words})
              AND "offset" NOT IN (SELECT "offset" FROM own WHERE bytes IS NOT NULL)`);
  const sizes = `SELECT "offset", size FROM told WHERE size <> 'unknown'`; // of groups that end by an element
  await same(connection, `SELECT "offset", size::VARCHAR AS size FROM own WHERE "offset" IN (SELECT "offset" FROM (${sizes}))`, sizes);
  // A name that stands for several ids is a number in the program's.
  await same(connection, `SELECT "offset", tag FROM own WHERE "offset" IN (SELECT "offset" FROM told WHERE element NOT LIKE '#%')`,
             `SELECT "offset", element FROM told WHERE element NOT LIKE '#%'`);
  await same(connection, `SELECT "offset", lower(hex(bytes)) AS bytes FROM own WHERE type = 'Binary'`,
             `SELECT "offset", bytes FROM told WHERE type = 'Binary'`);
  // A time that its text does not say is an object in the program's, and one after 2262 is none here.
  const dates = `SELECT "offset", TRY_CAST(left(replace(value, 'T', ' '), 26) AS TIMESTAMP_NS) AS time FROM told
                 WHERE type = 'UTC Timestamp' AND value LIKE '____-__-__T%'`;
  await same(connection, `SELECT "offset", time FROM own WHERE "offset" IN (SELECT "offset" FROM (${dates}))`, dates);
  return count;
}

/** Each row's parent is the group around it, and rows are numbered in the order of the stream. */
async function numbered(file)
{
  const from = `read_tav('${file}', on_damage := 'skip')`;
  assert.equal(await value(connection, `
    SELECT count(*) FROM ${from} AS child LEFT JOIN ${from} AS parent ON child.parent = parent.ord
    WHERE child.depth <> coalesce(parent.depth + 1, 0) OR child."offset" <= parent."offset" OR parent.type NOT LIKE 'group%'`), 0n);
  assert.equal(await value(connection, `SELECT count(*) FROM ${from} AS a JOIN ${from} AS b ON b.ord = a.ord + 1
                                        WHERE b."offset" <= a."offset"`), 0n);
}

for (const name of goldenNames)
{
  test(`golden vector ${name}`, async () => {
    const file = join(work, 'golden.tav');
    writeFileSync(file, golden(name));
    assert.ok(await agree(file) > 0);
    await numbered(file);
  });
}

const forms = [[], ['--swap'], ['--align', '--pairs'], ['--root32', '--strings'], ['--utf8', '--swap', '--align'],
               ['--mixed', '--pairs'], ['--open', '--pairs'], ['--wild'], ['--unfinished']];
for (const form of forms)
{
  test(`random trees ${form.join(' ')}`, async () => {
    const file = join(work, 'random.tav');
    for (let seed = 1; seed <= 23; ++seed)
    {
      program('tests/system/tools/tav_generate', [file, '--seed', `${seed}`, '--nodes', '300', ...form], {status: 0});
      await agree(file);
      await numbered(file);
    }
  });
}

test('damaged files are told, or read on behind the damage', async () => {
  const file = join(work, 'damaged.tav');
  let stopped = 0;
  for (let seed = 1; seed <= 12; ++seed)
  {
    program('tests/system/tools/tav_generate', [file, '--seed', `${seed}`, '--nodes', '200'], {status: 0});
    const bytes = readFileSync(file);
    const from = Math.floor(bytes.length * seed / 14);
    bytes.fill(0xee, from, from + 9);
    writeFileSync(file, bytes);
    await agree(file);
    stopped += await connection.run(`SELECT count(*) FROM read_tav('${file}')`).then(() => 0, (error) => {
      assert.match(error.message, /damaged\.tav: 0x[0-9a-f]+ \//);
      return 1;
    });
  }
  assert.ok(stopped >= 6, `${stopped} of 12 are damaged`);
});

test('hostile bytes end in rows or in a message', async () => {
  const file = join(work, 'hostile.tav');
  let read = 0;
  let random = 1;
  const next = (limit) => (random = (random * 48271) % 2147483647) % limit;
  for (let round = 0; round < 300; ++round)
  {
    const bytes = golden(goldenNames[round % goldenNames.length]);
    for (let i = 0; i <= round % 5; ++i)
    {
      bytes[next(bytes.length)] = [0, 0xff, 0x80, next(256)][next(4)];
    }
    writeFileSync(file, bytes.subarray(0, round % 3 === 0 ? next(bytes.length) + 1 : bytes.length));
    const how = round % 2 === 0 ? 'stop' : 'skip';
    read += await connection.run(`SELECT max(hash(COLUMNS(*))) FROM read_tav('${file}', on_damage := '${how}')`)
      .then(() => 1, (error) => assert.match(error.message, /hostile\.tav/) ?? 0);
  }
  assert.ok(read > 50 && read < 300);
});

test('values are in the column of their kind', async () => {
  const big = (2n ** 127n).toString();
  const file = make(join(work, 'values.tav'), {system: {
    cpuOnline: 7, hostName: 'ada', osName: {$type: 'UTF8 String', $value: 'é'}, cpuConfig: {$type: 'Uint128', $value: big},
    cpuSpeed: {$type: 'Sint128', $value: '-5'}, machineId: {$type: 'Sint32', $value: -7},
    timestamp: {$type: 'UTC Timestamp', $value: '2024-02-29T10:30:00.123456+00:00'}}});
  const found = await rows(connection, `SELECT tag, number::VARCHAR AS number, text, time::VARCHAR AS time FROM '${file}' WHERE depth = 1`);
  const by = Object.fromEntries(found.map((row) => [row.tag, [row.number, row.text, row.time]]));
  assert.deepEqual(by.cpuOnline, ['7', null, null]);
  assert.deepEqual(by.hostName, [null, 'ada', null]);
  assert.deepEqual(by.osName, [null, 'é', null]);
  assert.deepEqual(by.cpuConfig, [null, big, null]);
  assert.deepEqual(by.cpuSpeed, ['-5', null, null]);
  assert.deepEqual(by.timestamp, [null, null, '2024-02-29 10:30:00.123456']);
});

test('parameters say how a file is read', async () => {
  const file = make(join(work, 'big.tav'), {system: {hostName: 'ada', cpuOnline: 8}}, '--byte-order', 'big', '--align');
  assert.equal(await value(connection, `SELECT number FROM read_tav('${file}', byte_order := 'big', root := 64, align := true)
                                        WHERE tag = 'cpuOnline'`), 8n);
  for (const wrong of [`byte_order := 'middle'`, 'root := 48', `on_damage := 'ignore'`])
  {
    await assert.rejects(rows(connection, `FROM read_tav('${file}', ${wrong})`), /is '|is 32 or 64/);
  }
  const names = join(work, 'names.json');
  writeFileSync(names, '{"40001": {"tag": "queueDepth"}}');
  const own = make(join(work, 'own.tav'), {system: {'#40001': 3}});
  assert.equal(await value(connection, `SELECT tag FROM '${own}' WHERE id = 40001`), null);
  assert.equal(await value(connection, `SELECT tag FROM read_tav('${own}', dictionary := '${names}') WHERE id = 40001`),
               'queueDepth');
});

test('names of files, patterns and lists', async () => {
  const streams = folder();
  for (let i = 0; i < 1000; ++i)
  {
    writeFileSync(join(streams, `${i}.tav`), golden('nested64Big.hex'));
  }
  const each = await value(connection, `SELECT count(*) FROM '${streams}/7.tav'`);
  assert.equal(await value(connection, `SELECT count(*) FROM '${streams}/*.tav'`), each * 1000n);
  assert.equal(await value(connection, `SELECT count(DISTINCT file) FROM '${streams}/[1-3]?.tav'`), 30n);
  assert.equal(await value(connection, `SELECT count(DISTINCT file) FROM read_tav(['${streams}/1.tav', '${streams}/2*.tav'])`), 112n);
  assert.equal(await value(connection, `SELECT count(*) FROM '${streams}/../**/7.tav'`) >= each, true);
  await assert.rejects(rows(connection, `FROM '${streams}/x*.tav'`), /no file matches/);
  await assert.rejects(rows(connection, `FROM '${streams}/x.tav'`), /x\.tav: .*KOR_RC_NO_SUCH_FILE/);
  await assert.rejects(rows(connection, `FROM read_tav([])`), /names no file/);
});

/** A stream of one root with more in it than is read at once. */
function large()
{
  const host = {hostName: 'a name of some length', cpuOnline: 8, cpu: {cpuSpeed: 7919, cpuConfig: 3}};
  return make(join(work, 'large.tav'), {system: {host: Array(260_000).fill(host)}});
}
const largeFile = large();

/** How many rows there are, and a sum over all of their columns. */
async function sumOf(engine, from)
{
  return await rows(engine, `SELECT count(*) AS count, sum(hash(ord, parent, depth, "offset", size, tag, number, text)) AS sum FROM ${from}`);
}

/** The rows of a file that is read as a whole, as it is where paths are asked for, and by how many threads others are. */
async function agreeInParts(file)
{
  const from = `read_tav('${file}', on_damage := 'skip')`;
  const whole = await sumOf(connection, `(SELECT *, path FROM ${from}) WHERE path <> ''`);
  for (const threads of ['1', '2', '5'])
  {
    assert.deepEqual(await sumOf(await open({threads}), from), whole);
  }
  return Number(whole[0].count);
}

test('parts of a large file are one file', async () => {
  assert.ok(readFileSync(largeFile).length > 16 << 20);
  assert.equal(await agreeInParts(largeFile), 1 + 260_000 * 6);
});

test('parts of a large damaged file are one file', async () => {
  const file = join(work, 'largeDamaged.tav');
  const bytes = readFileSync(largeFile);
  for (let i = 1; i < 9; ++i)
  {
    const from = Math.floor(bytes.length * i / 9);
    bytes.fill(0xee, from, from + 30);
  }
  writeFileSync(file, bytes);
  assert.ok(await agreeInParts(file) > 1_500_000);
  // Which thread fails first is up to chance; the message must not be.
  for (const threads of ['1', '2', '5'])
  {
    const engine = await open({threads});
    for (let i = 0; i < 20; ++i)
    {
      await assert.rejects(rows(engine, `SELECT count(*) FROM read_tav('${file}')`), /largeDamaged\.tav: 0x/);
    }
  }
});

test('streams of several forms one behind the other, in parts', async () => {
  const file = join(work, 'several.tav');
  const bytes = readFileSync(largeFile);
  const other = make(join(work, 'other.tav'), {system: {host: Array(2000).fill({hostName: 'b', cpuOnline: 9})}}, '--byte-order', 'big', '--align');
  writeFileSync(file, Buffer.concat([bytes, readFileSync(other), bytes]));
  assert.equal(await agreeInParts(file), 2 * (1 + 260_000 * 6) + 6001);
});

test('a file that is cut while it is read ends in a message', async () => {
  const file = join(work, 'cut.tav');
  for (const query of [`max(hash(path, text)) FROM '${file}'`, `count(*) FROM '${file}'`,
                       `max(a) FROM read_tav_table('${file}', each := '//host', columns := {'a': 'hostName'})`])
  {
    writeFileSync(file, readFileSync(largeFile));
    const one = await open({threads: '1'});
    const pending = await one.start(`SELECT ${query}`);
    pending.runTask();
    truncateSync(file, 1000);
    await assert.rejects(async () => (await pending.getResult()).getRows(), /cut\.tav: /);
  }
});

test('the memory that the engine may take is kept', () => {
  // A process of its own, of which the most memory is known.
  const script = `
    import {open} from '${join(root, 'duckdb/tests/engine.mjs')}';
    const one = await open({threads: '2', memory_limit: '100MB', temp_directory: '${work}/spill'});
    const before = process.resourceUsage().maxRSS;
    await one.run("COPY (SELECT * FROM '${largeFile}' ORDER BY hash(ord)) TO '${work}/sorted.csv'");
    console.log(process.resourceUsage().maxRSS - before);`;
  const done = spawnSync(process.execPath, ['--input-type=module', '-e', script], {env: {...process.env}});
  assert.equal(done.status, 0, done.stderr.toString());
  const kibibytes = Number(done.stdout.toString());
  assert.ok(kibibytes < 400 * 1024, `${kibibytes} KiB`);
});

test('what is not asked for is not read', async () => {
  const size = 32 << 20;
  const file = make(join(work, 'long.tav'), {system: {cpuOnline: 8, hostName: 'x'.repeat(size)}});
  const readBy = async (sql) => {
    // What the process has read of files, whether the system had it in memory or not.
    const bytes = () => Number(/^rchar: (\d+)$/m.exec(readFileSync('/proc/self/io', 'latin1'))[1]);
    const before = bytes();
    await rows(connection, sql);
    return bytes() - before;
  };
  for (const sql of [`SELECT count(*) FROM '${file}'`, `SELECT max(size), max(tag), max(path) FROM '${file}'`])
  {
    assert.ok(await readBy(sql) < size / 4, sql);
  }
  assert.ok(await readBy(`SELECT max(length(text)) FROM '${file}'`) >= size);
});
