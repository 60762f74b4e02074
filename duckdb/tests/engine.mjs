// The engine with the extension in it, and the program `tav` beside it.
import assert from 'node:assert/strict';
import {spawnSync} from 'node:child_process';
import {mkdtempSync, readFileSync, readdirSync, rmSync} from 'node:fs';
import {tmpdir} from 'node:os';
import {dirname, join, resolve} from 'node:path';
import {fileURLToPath} from 'node:url';

import {DuckDBInstance} from '@duckdb/node-api';

export const root = resolve(dirname(fileURLToPath(import.meta.url)), '../..');
export const build = process.env.TAV_BUILD ?? join(root, 'build/release');
export const extension = join(build, 'duckdb/tav.duckdb_extension');

/** A connection to an engine of its own, in memory. */
export async function open(settings = {})
{
  const instance = await DuckDBInstance.create(':memory:', {allow_unsigned_extensions: 'true', ...settings});
  const connection = await instance.connect();
  await connection.run(`LOAD '${extension}'`);
  return connection;
}

/** The rows of a query, as objects: numbers of more than 32 bits are bigints. */
export async function rows(connection, sql)
{
  return (await connection.runAndReadAll(sql)).getRowObjects();
}

/** The one value that a query gives. */
export async function value(connection, sql)
{
  return (await connection.runAndReadAll(sql)).getRows()[0][0];
}

/** What a program of the build prints. */
export function program(name, args, {status, input} = {})
{
  const done = spawnSync(join(build, name), args, {input, maxBuffer: 1 << 30});
  if (status !== undefined && done.status !== status)
  {
    throw new Error(`${name} ${args.join(' ')}: ${done.status}: ${done.stderr}`);
  }
  return done.stdout;
}

export const tav = (args, options = {}) => program('tools/tav', args, {status: 0, ...options}).toString();

/** A folder that goes with the process. */
export function folder()
{
  const made = mkdtempSync(join(tmpdir(), 'tav-sql-'));
  process.on('exit', () => rmSync(made, {recursive: true, force: true}));
  return made;
}

/** Writes a stream of a JSON document, as `tav build` reads it. */
export function make(file, document, ...options)
{
  tav(['build', '-', '-o', file, '--force', ...options], {input: JSON.stringify(document)});
  return file;
}

/** The bytes of a golden vector. */
export function golden(name)
{
  const lines = readFileSync(join(root, 'tests/golden', name), 'latin1').split('\n');
  return Buffer.from(lines.map((line) => line.replace(/#.*/, '')).join('').replace(/\s/g, ''), 'hex');
}

export const goldenNames = readdirSync(join(root, 'tests/golden')).filter((name) => name.endsWith('.hex')).sort();

/** Whether two queries have the same rows, each as often. */
export async function same(connection, a, b)
{
  const counts = await rows(connection, `
    SELECT (SELECT count(*) FROM (${a})) AS a, (SELECT count(*) FROM (${b})) AS b,
           (SELECT count(*) FROM (${a} EXCEPT ALL ${b})) AS more, (SELECT count(*) FROM (${b} EXCEPT ALL ${a})) AS less`);
  if (counts[0].more !== 0n || counts[0].less !== 0n || counts[0].a !== counts[0].b)
  {
    const more = await rows(connection, `${a} EXCEPT ALL ${b} LIMIT 5`);
    const less = await rows(connection, `${b} EXCEPT ALL ${a} LIMIT 5`);
    assert.deepEqual({count: counts[0].a, rows: more}, {count: counts[0].b, rows: less});
  }
  return Number(counts[0].a);
}
