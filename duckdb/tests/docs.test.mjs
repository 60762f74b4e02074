// The questions of docs/sql.md have answers.
import assert from 'node:assert/strict';
import {readFileSync, readdirSync, writeFileSync} from 'node:fs';
import {join} from 'node:path';
import {test} from 'node:test';

import {folder, make, open, root, rows} from './engine.mjs';

const page = readFileSync(join(root, 'docs/sql.md'), 'utf8');
const questions = [...page.matchAll(/^```sql\n((?:.*\n)*?)```$/gm)].map((match) => match[1]);

/** An hour and a half of two hosts with two databases each. */
function day(file, names)
{
  const host = (name, minute, cpus) => ({
    hostName: name, cpu: {cpuOnline: cpus},
    queueStore: ['orders', 'users'].map((store, i) => ({storeName: store, reads: {$type: 'Uint64', $value: minute * (i + 1) * 100}}))});
  const system = (minute) => ({
    timestamp: {$type: 'UTC Timestamp', $value: `2024-02-29T1${Math.floor(minute / 60)}:${String(minute % 60).padStart(2, '0')}:00.000000+00:00`},
    host: [host('ada', minute, 4 + minute % 3), host('bob', minute, 8)]});
  return make(file, {system: Array.from({length: 90}, (_, minute) => system(minute))}, '--dictionary', names);
}

test('ten questions', async () => {
  const work = folder();
  process.chdir(work);
  writeFileSync('names.json', JSON.stringify({40001: {tag: 'queueStore'}, 40002: {tag: 'storeName'}, 40003: {tag: 'reads'}}));
  const bytes = readFileSync(day('day.tav', 'names.json'));
  bytes.fill(0xee, 5000, 5020);
  writeFileSync('damaged.tav', bytes);
  const connection = await open();
  assert.equal(questions.length, 10);
  const answers = [];
  for (const question of questions)
  {
    answers.push(await rows(connection, question.replace(/;\s*$/, '')).catch((error) => {
      throw new Error(`${question}\n${error.message}`);
    }));
  }
  assert.deepEqual(answers[0], [{host: 'ada', times: 90n}, {host: 'bob', times: 90n}]);
  assert.ok(answers[1].some((row) => row.tag === 'hostName' && row.nodes === 180n));
  assert.equal(answers[2][0].host, 'bob');
  assert.equal(answers[3][0].store, 'users');
  assert.equal(answers[3][0].reads, 2n * (60n * 200n - 200n));
  assert.equal(answers[5].length, 2);
  assert.equal(answers[6].length, 1);
  assert.equal(answers[7].length, 180);
  assert.ok(answers[8][0].nodes > 0n);
  // What was written is read back by the engine alone, a folder a host, with all rows of the table.
  const [{table}] = [...questions[9].matchAll(/FROM (?<table>read_tav_table\([^;]*?\))\)\nTO/g)].map((match) => match.groups);
  const written = await rows(connection, `SELECT * FROM read_parquet('hosts/*/*.parquet', hive_partitioning = true)`);
  const wanted = await rows(connection, `FROM ${table}`);
  const line = (row) => [row.host, row.filename, String(row.taken), String(row.cpus)].join('|');
  assert.deepEqual(written.map(line).sort(), wanted.map(line).sort());
  assert.deepEqual(readdirSync('hosts').sort(), ['host=ada', 'host=bob']);
  assert.ok(wanted.length > 300 && wanted.every((row) => row.host !== null));
});
