// The engine with the extension in it, and the program `tav` beside it.
import {spawnSync} from 'node:child_process';
import {mkdtempSync, rmSync} from 'node:fs';
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
export function program(name, args, {status = 0, input} = {})
{
  const done = spawnSync(join(build, name), args, {input, maxBuffer: 1 << 30});
  if (done.status !== status)
  {
    throw new Error(`${name} ${args.join(' ')}: ${done.status}: ${done.stderr}`);
  }
  return done.stdout;
}

export const tav = (args, options) => program('tools/tav', args, options).toString();

/** A folder that goes with the process. */
export function folder()
{
  const made = mkdtempSync(join(tmpdir(), 'tav-sql-'));
  process.on('exit', () => rmSync(made, {recursive: true, force: true}));
  return made;
}
