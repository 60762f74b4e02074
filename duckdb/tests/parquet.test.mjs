// tav table --format parquet, by the engine that is installed here.
import assert from 'node:assert/strict';
import {spawnSync} from 'node:child_process';
import {existsSync, mkdirSync, readFileSync, readdirSync, writeFileSync} from 'node:fs';
import {join} from 'node:path';
import {test} from 'node:test';

import {build, extension, folder, golden, make, open, root, rows, same, value} from './engine.mjs';

const work = folder();
const connection = await open();
const engine = join(root, 'duckdb/commandLine.mjs');
const environment = {...process.env, HOME: work, TAV_DUCKDB: engine, TAV_DUCKDB_EXTENSION: extension};
const file = join(work, 'day.tav');

make(file, {system: Array.from({length: 30}, (_, i) => ({
  timestamp: {$type: 'UTC Timestamp', $value: `2024-02-29T10:${String(i).padStart(2, '0')}:00.123456+00:00`},
  host: [{hostName: `h"${i}`, cpuOnline: i}, {hostName: i % 3 === 0 ? '' : `b,${i}`, cpuSpeed: {$type: 'Sint32', $value: -i}}]}))});

const columns = {name: 'hostName', cpus: 'cpuOnline', speed: 'cpuSpeed', taken: '../timestamp', gone: 'osName'};
const words = ['--each', '//host', ...Object.entries(columns).flatMap(([name, path]) => ['--col', `${name}=${path}`])];
const list = (items) => `{${Object.entries(items).map(([name, path]) => `'${name}': '${path}'`)}}`;
const table = `read_tav_table('${file}', each := '//host', columns := ${list(columns)})`;

/** Runs `tav table --format parquet`. */
function parquet(args, status = 0, env = environment)
{
  const done = spawnSync(join(build, 'tools/tav'), ['table', '--format', 'parquet', ...args], {env, maxBuffer: 1 << 30});
  assert.equal(done.status, status, `${args.join(' ')}: ${done.stderr}`);
  return {out: done.stdout, err: done.stderr.toString()};
}

/** The rows of a file. */
const written = (name) => rows(connection, `FROM read_parquet('${name.replaceAll("'", "''")}')`);

test('the rows are those of the table, in their order', async () => {
  const out = join(work, 'out.parquet');
  parquet([file, ...words, '-o', out]);
  assert.deepEqual(await written(out), await rows(connection, `FROM ${table}`));
  assert.equal(await same(connection, `SELECT * FROM '${out}'`, `SELECT * FROM ${table}`), 60);
});

test('standard output gets the same bytes', () => {
  assert.deepEqual(parquet([file, ...words]).out, readFileSync(join(work, 'out.parquet')));
});

test('the file and labels are columns, and values are joined', async () => {
  const out = join(work, 'labels.parquet');
  parquet([file, '--each', '/system', '--col', 'n=host/hostName', '--file', '--label', `site=a'b\\c\n"é`, '--join', `'`, '-o', out]);
  const [first] = await written(out);
  assert.deepEqual(first, {file, site: `a'b\\c\n"é`, n: `h"0'`});
});

test('names that mean something to a shell, to SQL or to the engine\'s program are names', async () => {
  const names = [`a'b.tav`, `a\\'; COPY (SELECT 1) TO 'x.tav`, 'a\n.shell touch shell\n.tav', '$(touch shell).tav', `"a";.tav`,
                 '*.tav', '[a-c]?.tav', '.quit', '-unsigned', '日.tav', `a\x01\x7f.tav`];
  const place = folder();
  names.forEach((name, i) => make(join(place, name), {system: {cpuOnline: i}}));
  const out = join(place, `o'u\n.shell touch shell\n.parquet`);
  const done = spawnSync(join(build, 'tools/tav'), ['table', '--format', 'parquet', '--each', '/system', '--col', 'n=cpuOnline',
                                                   '--file', '-o', out, '--', ...names], {env: environment, cwd: place});
  assert.equal(done.status, 0, done.stderr);
  assert.deepEqual(readdirSync(place).sort(), [...names, out.slice(place.length + 1)].sort());
  writeFileSync(join(place, 'plain'), readFileSync(out));
  assert.deepEqual(await written(join(place, 'plain')), names.map((file, i) => ({file, n: BigInt(i)})));
});

test('a name that is no text', () => {
  const bytes = Buffer.concat([Buffer.from(`${work}/`), Buffer.from([0xff, 0xfe]), Buffer.from('.tav')]);
  writeFileSync(bytes, readFileSync(file));
  // A name of two bytes, which is no text here either.
  const done = spawnSync('sh', ['-c', `exec "$0" table --format parquet "$1"/??.tav --each /system --col a=hostName`,
                                join(build, 'tools/tav'), work], {env: {...environment, LC_ALL: 'C'}});
  assert.equal(done.status, 2);
  assert.match(done.stderr.toString(), /UTF-8/);
});

test('names of columns', async () => {
  const out = join(work, 'columns.parquet');
  parquet([file, '--each', '//host', '--col', `hostName[. = 'h"1']`, '--col', 'cpuOnline', '-o', out]);
  assert.deepEqual(Object.keys((await written(out))[0]), [`hostName[. = 'h"1']`, 'cpuOnline']);
  assert.match(parquet([file, '--each', '//host', '--col', 'a=hostName', '--col', 'A=cpuOnline'], 2).err, /one name in SQL/);
});

test('forms and names of own elements are handed on', async () => {
  const names = join(work, 'names.json');
  writeFileSync(names, '{"40001": {"tag": "queueDepth"}}');
  const out = join(work, 'own.parquet');
  const big = make(join(work, 'big.tav'), {system: {'#40001': 7}}, '--byte-order', 'big', '--align');
  for (const more of [['--dictionary', names], ['--dictionary', names, '--byte-order', 'big', '--root', '64', '--align']])
  {
    parquet([big, '--each', '/system', '--col', 'queueDepth', ...more, '-o', out, '--force']);
    assert.deepEqual(await written(out), [{queueDepth: 7n}]);
  }
  writeFileSync(`${big}.names.json`, '{"40001": {"tag": "depthOfQueue"}}');
  parquet([big, '--each', '/system', '--col', 'depthOfQueue', '-o', out, '--force']);
  assert.deepEqual(await written(out), [{depthOfQueue: 7n}]);
  assert.match(parquet([big, file, '--each', '/system', '--col', 'a=hostName'], 2).err, /own elements have other names/);
});

test('damage leaves no file, or is passed over and told', async () => {
  const bytes = golden('types.hex');
  const damaged = join(work, 'damaged.tav');
  writeFileSync(damaged, Buffer.concat([bytes, Buffer.from(bytes).fill(0xee, 40, 60)]));
  const place = folder();
  const out = join(place, 'out.parquet');
  const asked = [damaged, '--each', '//*', '--col', 'a=.', '-o', out];
  const stopped = parquet(asked, 1).err;
  assert.match(stopped, /damaged\.tav: 0x/);
  assert.match(stopped, /nothing is written/);
  assert.deepEqual(readdirSync(place), []);
  assert.match(parquet([...asked, '--on-damage', 'skip'], 1).err, /damaged\.tav: 0x/);
  assert.ok((await written(out)).length > 0);
  // As for every format, the highest status of the files counts, and others are read.
  const none = join(work, 'none.tav');
  parquet([file, none, ...words, '-o', out, '--force'], 2);
  assert.equal((await written(out)).length, 60);
  writeFileSync(none, 'no stream');
  parquet([file, none, ...words, '-o', out, '--force'], 3);
  assert.equal((await written(out)).length, 60);
  parquet([file, '--each', '//host', '--col', 'a=osName', '--each', '/system/osName', '-o', out, '--force'], 1);
  assert.equal((await written(out)).length, 0);
});

test('an existing file is replaced when that is asked for', async () => {
  const out = join(work, 'there.parquet');
  writeFileSync(out, 'mine');
  assert.match(parquet([file, ...words, '-o', out], 2).err, /--force/);
  assert.equal(readFileSync(out, 'utf8'), 'mine');
  parquet([file, ...words, '-o', out, '--force']);
  assert.equal((await written(out)).length, 60);
});

test('the extension is one file, or installed in the engine, or missing', async () => {
  const {TAV_DUCKDB_EXTENSION: _, ...installed} = environment;
  const place = folder();
  const out = join(place, 'out.parquet');
  const missing = parquet([file, ...words, '-o', out], 2, installed).err;
  assert.match(missing, /the extension is not there/);
  assert.match(missing, /INSTALL 'tav\.duckdb_extension'/);
  assert.equal(existsSync(out), false);
  const install = spawnSync(engine, ['-unsigned', '-batch', '-bail'], {env: installed, input: `INSTALL '${extension}'`});
  assert.equal(install.status, 0, install.stderr);
  parquet([file, ...words, '-o', out], 0, installed);
  assert.equal((await written(out)).length, 60);
  // It is found on PATH, too.
  mkdirSync(join(place, 'bin'));
  writeFileSync(join(place, 'bin/duckdb'), `#!/bin/sh\nexec '${process.execPath}' '${engine}' "$@"\n`, {mode: 0o755});
  const {TAV_DUCKDB: __, ...onPath} = installed;
  parquet([file, ...words, '-o', out, '--force'], 0, {...onPath, PATH: `${join(place, 'bin')}:${process.env.PATH}`});
  assert.equal(await value(connection, `SELECT count(*) FROM '${out}'`), 60n);
});

test('several thousand files are one table', async () => {
  const place = folder();
  const files = Array.from({length: 3000}, (_, i) => join(place, `${'long'.repeat(20)}${i}.tav`));
  for (const name of files)
  {
    writeFileSync(name, golden('nested64Big.hex'));
  }
  const out = join(work, 'many.parquet');
  parquet([...files, '--each', '/*', '--col', 'a=*', '--file', '-o', out]);
  assert.deepEqual((await rows(connection, `SELECT DISTINCT file FROM '${out}' ORDER BY file`)).map((row) => row.file), files.sort());
});
