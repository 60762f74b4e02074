// read_tav_table: a row for each node that a path leads to, as `tav table` writes it.
import assert from 'node:assert/strict';
import {readFileSync, writeFileSync} from 'node:fs';
import {join} from 'node:path';
import {test} from 'node:test';

import {folder, golden, goldenNames, make, open, program, rows, same, tav, value} from './engine.mjs';

const work = folder();
const connection = await open();

function columnsOf(columns)
{
  return `{${Object.entries(columns).map(([name, path]) => `'${name}': '${path}'`).join(', ')}}`;
}

/** The table of files in SQL, and what `tav table` makes of them, have the same cells. Of bytes CSV does not say whether
    they are none or missing: `bytes` takes them for the same. */
async function agree(files, each, columns, {bytes = false} = {})
{
  const args = Object.entries(columns).flatMap(([name, path]) => ['--col', `${name}=${path}`]);
  const csv = join(work, 'table.csv');
  writeFileSync(csv, program('tools/tav', ['table', ...files, '--each', each, ...args, '--file', '--on-damage', 'skip']));
  const table = `read_tav_table([${files.map((file) => `'${file}'`)}], each := '${each}', columns := ${columnsOf(columns)},
                                on_damage := 'skip', filename := true)`;
  const types = Object.fromEntries((await rows(connection, `DESCRIBE FROM ${table}`)).map((row) => [row.column_name, row.column_type]));
  const isTime = (name) => types[name] === 'TIMESTAMP_NS';
  const isBlob = (name) => types[name] === 'BLOB';
  const text = (name) => isBlob(name) ? `lower(hex(${name}))` : `${name}::VARCHAR`;
  const cells = Object.keys(columns).map((name) =>
    isTime(name) ? name : bytes ? `nullif(${text(name)}, '') AS ${name}` : `${text(name)} AS ${name}`);
  const told = Object.keys(columns).map((name) =>
    isTime(name) ? `replace(replace(${name}, 'T', ' '), 'Z', '')::TIMESTAMP_NS AS ${name}` :
      bytes ? `nullif(${name}, '') AS ${name}` : name);
  const lines = `read_csv('${csv}', all_varchar = true, header = true, delim = ',', quote = '"', escape = '"',
                          allow_quoted_nulls = false, max_line_size = 10000000, parallel = false)`;
  return await same(connection, `SELECT filename, ${cells} FROM ${table}`, `SELECT file, ${told} FROM ${lines}`);
}

const forms = [[], ['--byte-order', 'big'], ['--align', '--byte-order', 'big'], ['--root', '32']];

function series(file, ...options)
{
  const system = (i) => ({
    timestamp: {$type: 'UTC Timestamp', $value: `2024-02-29T10:${String(i % 60).padStart(2, '0')}:00.123456+00:00`},
    host: [{hostName: `h"${i}`, cpuOnline: i}, {hostName: i % 3 === 0 ? '' : `b,${i}`, cpuSpeed: {$type: 'Sint32', $value: -i}}]});
  return make(join(work, file), {system: Array.from({length: 50}, (_, i) => system(i))}, ...options);
}

for (const form of forms)
{
  test(`a series ${form.join(' ')}`, async () => {
    const file = series('series.tav', ...form);
    const columns = {name: 'hostName', cpus: 'cpuOnline', speed: 'cpuSpeed', taken: '../timestamp', gone: 'osName'};
    assert.equal(await agree([file], '/system/host', columns), 100);
  });
}

test('golden vectors and random trees', async () => {
  const file = join(work, 'one.tav');
  for (const name of goldenNames)
  {
    writeFileSync(file, golden(name));
    await agree([file], '//*', {name: '.', below: '*', deep: '*//*'}, {bytes: true});
  }
  for (let seed = 1; seed <= 10; ++seed)
  {
    program('tests/system/tools/tav_generate', [file, '--seed', `${seed}`, '--nodes', '300', '--strings'], {status: 0});
    await agree([file], '//*', {own: '.', below: '*'}, {bytes: true});
  }
});

test('several files of different forms are one table', async () => {
  const files = [series('little.tav'), series('large.tav', '--byte-order', 'big', '--align'), series('narrow.tav', '--root', '32')];
  assert.equal(await agree(files, '//host', {name: 'hostName', cpus: 'cpuOnline', taken: '../timestamp'}), 300);
});

test('a column has the type that holds all of its values', async () => {
  const first = make(join(work, 'first.tav'), {system: {cpuOnline: 5, osName: 'x'}});
  const second = make(join(work, 'second.tav'), {system: {cpuOnline: {$type: 'Sint32', $value: -5}, osName: 7}});
  const big = make(join(work, 'wide.tav'), {system: {cpuOnline: {$type: 'Uint128', $value: (2n ** 127n).toString()}}});
  const typeOf = async (files, path) => (await rows(connection, `DESCRIBE FROM read_tav_table(${files}, each := '/system', columns := {'c': '${path}'})`))[0].column_type;
  assert.equal(await typeOf(`'${first}'`, 'cpuOnline'), 'UBIGINT');
  assert.equal(await typeOf(`['${first}', '${second}']`, 'cpuOnline'), 'BIGINT');
  assert.equal(await typeOf(`['${first}', '${big}']`, 'cpuOnline'), 'UHUGEINT');
  assert.equal(await typeOf(`['${second}', '${big}']`, 'cpuOnline'), 'VARCHAR');
  assert.equal(await typeOf(`['${first}', '${second}']`, 'osName'), 'VARCHAR');
  assert.equal(await typeOf(`'${first}'`, 'hostName'), 'VARCHAR');
  assert.equal(await value(connection, `SELECT max(c) FROM read_tav_table('${big}', each := '/system', columns := {'c': 'cpuOnline'})`), 2n ** 127n);
});

test('what the engine writes is read back equal', async () => {
  const file = series('written.tav');
  const table = `FROM read_tav_table('${file}', each := '//host', columns := {'name': 'hostName', 'cpus': 'cpuOnline', 'speed': 'cpuSpeed', 'taken': '../timestamp'})`;
  await connection.run(`COPY (${table}) TO '${work}/t.parquet' (FORMAT parquet)`);
  assert.equal(await same(connection, table.replace('FROM', 'SELECT * FROM'), `SELECT * FROM '${work}/t.parquet'`), 100);
  await connection.run(`COPY (${table}) TO '${work}/t.csv' (FORMAT csv, NULL '-')`);
  assert.equal(await same(connection, table.replace('FROM', 'SELECT * FROM'), `SELECT * FROM read_csv('${work}/t.csv', nullstr = '-',
    columns = {'name': 'VARCHAR', 'cpus': 'UBIGINT', 'speed': 'BIGINT', 'taken': 'TIMESTAMP_NS'})`), 100);
});

test('some of the columns, in another order, and none', async () => {
  const file = series('some.tav');
  const from = `read_tav_table('${file}', each := '//host', columns := {'a': 'hostName', 'b': 'cpuOnline', 'c': 'cpuSpeed'}, filename := true)`;
  const all = await rows(connection, `FROM ${from}`);
  assert.deepEqual(await rows(connection, `SELECT c, a FROM ${from}`), all.map(({c, a}) => ({c, a})));
  assert.deepEqual(await rows(connection, `SELECT filename, b FROM ${from}`), all.map(({filename, b}) => ({filename, b})));
  assert.equal(await value(connection, `SELECT count(*) FROM ${from}`), 100n);
});

test('several values are joined', async () => {
  const file = make(join(work, 'join.tav'), {system: {cpuOnline: [1, 2, 3]}});
  assert.equal(await value(connection, `FROM read_tav_table('${file}', each := '/system', columns := {'c': 'cpuOnline'}, join := '+')`), '1+2+3');
});

test('what makes no sense is told', async () => {
  const file = series('told.tav');
  const fails = (rest, message) => assert.rejects(rows(connection, `FROM read_tav_table('${file}'${rest})`), message);
  await fails('', /each := /);
  await fails(`, each := '/system'`, /columns := /);
  await fails(`, each := '/sistem', columns := {'a': 'hostName'}`, /system/);
  await fails(`, each := '/system[', columns := {'a': 'hostName'}`, /column/);
  await fails(`, each := '/system', columns := {'a': 7}`, /is no text/);
});

test('damage ends a query unless it is skipped', async () => {
  const file = join(work, 'damaged.tav');
  const bytes = golden('types.hex');
  writeFileSync(file, Buffer.concat([bytes, bytes.fill(0xee, 40, 60)]));
  const from = (how) => `SELECT count(*) FROM read_tav_table('${file}', each := '//*', columns := {'a': '.'}, on_damage := '${how}')`;
  await assert.rejects(value(connection, from('stop')), /damaged\.tav: 0x/);
  assert.ok(await value(connection, from('skip')) > 0n);
});

/** A file of so much that it is read in parts, each row of which tells its place. */
function large()
{
  const host = (i) => ({hostName: `host ${i}`, cpu: {cpuOnline: i, osName: 'a text of some length, so that the file is large'.repeat(2)}});
  return make(join(work, 'hosts.tav'), {system: {host: Array.from({length: 110_000}, (_, i) => host(i))}});
}
const largeFile = large();

/** The rows as `tav table` has them, by any number of threads; with one also in their order. */
async function agreeInParts(file)
{
  const columns = {name: 'hostName', cpus: 'cpu/cpuOnline', os: 'cpu/osName'};
  const table = `read_tav_table('${file}', each := '//host', columns := ${columnsOf(columns)}, on_damage := 'skip')`;
  const count = await agree([file], '//host', columns);
  const all = await rows(connection, `SELECT count(*) AS n, sum(hash(t)) AS sum FROM ${table} AS t`);
  for (const threads of ['1', '2', '5'])
  {
    assert.deepEqual(await rows(await open({threads}), `SELECT count(*) AS n, sum(hash(t)) AS sum FROM ${table} AS t`), all);
  }
  const one = await open({threads: '1'});
  const names = (await one.runAndReadAll(`SELECT name FROM ${table}`)).getColumns()[0];
  const told = program('tools/tav', ['table', file, '--each', '//host', '--col', 'hostName', '--on-damage', 'skip', '--format', 'tsv']);
  assert.deepEqual(names.map((name) => name ?? ''), told.toString().split('\n').slice(1, -1));
  return count;
}

test('parts of a large file are one table', async () => {
  assert.ok(readFileSync(largeFile).length > 16 << 20);
  assert.equal(await agreeInParts(largeFile), 110_000);
});

test('parts of a large damaged file are one table', async () => {
  const file = join(work, 'hostsDamaged.tav');
  const bytes = readFileSync(largeFile);
  for (let i = 1; i < 9; ++i)
  {
    const from = Math.floor(bytes.length * i / 9);
    bytes.fill('~', from, from + 30); // which is text where it falls into one
  }
  writeFileSync(file, bytes);
  assert.ok(await agreeInParts(file) > 100_000);
  for (const threads of ['1', '3'])
  {
    await assert.rejects(rows(await open({threads}), `SELECT count(*) FROM read_tav_table('${file}', each := '//host', columns := {'a': 'hostName'})`),
                         /hostsDamaged\.tav: 0x/);
  }
});

test('places that look like nodes do not cut a table there', async () => {
  // Payloads of as many bytes as a part, full of what is a host elsewhere.
  const host = readFileSync(make(join(work, 'host.tav'), {host: {hostName: 'none of them', cpuOnline: 1}}));
  const filler = 'x'.repeat(6 << 20);
  const file = make(join(work, 'seams.tav'), {system: {host: Array.from({length: 8}, (_, n) => ({hostName: `real ${n}`, osVersion: filler}))}});
  const bytes = readFileSync(file);
  for (let at = 0; (at = bytes.indexOf(filler.slice(0, 1000), at)) >= 0; at += filler.length)
  {
    bytes.fill(host, at, at + filler.length);
  }
  writeFileSync(file, bytes);
  assert.ok(readFileSync(file).length > 16 << 20);
  assert.equal(await agreeInParts(file), 8);
});

test('streams of several forms one behind the other are one table, in parts', async () => {
  const file = join(work, 'several.tav');
  const other = make(join(work, 'other.tav'), {system: {host: Array(2000).fill({hostName: 'b', cpuOnline: 9})}}, '--byte-order', 'big', '--align');
  writeFileSync(file, Buffer.concat([readFileSync(largeFile), readFileSync(other), readFileSync(largeFile)]));
  assert.equal(await agreeInParts(file), 222_000);
});
