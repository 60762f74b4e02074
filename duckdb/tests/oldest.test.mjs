// The extension in the oldest engine that is tried.
import assert from 'node:assert/strict';
import {join} from 'node:path';
import {test} from 'node:test';

import {DuckDBInstance} from 'duckdb-oldest';

import {extension, folder, make} from './engine.mjs';

test('an engine of an earlier version loads it', async () => {
  const file = make(join(folder(), 'day.tav'), {system: {hostName: 'ada', cpuOnline: 8}});
  const instance = await DuckDBInstance.create(':memory:', {allow_unsigned_extensions: 'true'});
  const connection = await instance.connect();
  await connection.run(`LOAD '${extension}'`);
  const first = async (sql) => (await connection.runAndReadAll(sql)).getRows()[0];
  assert.deepEqual(await first('SELECT version()'), ['v1.3.2']);
  assert.deepEqual(await first(`SELECT count(*), max(text), max(number) FROM '${file}'`), [3n, 'ada', 8n]);
  assert.deepEqual(await first(`FROM read_tav_table('${file}', each := '/system', columns := {'h': 'hostName'})`), ['ada']);
});
