// What the engine is told before a query runs, and how it ends one that runs.
import assert from 'node:assert/strict';
import {readFileSync, statSync} from 'node:fs';
import {join} from 'node:path';
import {test} from 'node:test';

import {folder, make, open, rows, value} from './engine.mjs';

const work = folder();
const connection = await open();
const small = make(join(work, 'small.tav'), {system: {hostName: 'ada', cpuOnline: 8}});
const host = {hostName: 'a name of some length', cpuOnline: 8, cpu: {cpuSpeed: 7919, cpuConfig: 3}};
const large = make(join(work, 'large.tav'), {system: {host: Array(260_000).fill(host)}});
assert.ok(statSync(large).size > 16 << 20);

/** The plan of a query as a tree. */
async function planOf(sql)
{
  const [{explain_value: plan}] = await rows(connection, `EXPLAIN (FORMAT json) ${sql}`);
  return JSON.parse(plan)[0];
}

const estimate = (node) => Number(node.extra_info['Estimated Cardinality']);

function joinIn(node)
{
  return node.name === 'HASH_JOIN' ? node : node.children.map(joinIn).find((found) => found !== undefined);
}

test('the engine knows how many nodes there are, about', async () => {
  for (const [files, count] of [[[large], 1 + 260_000 * 6], [[large, large, small], 2 * (1 + 260_000 * 6) + 3], [[small], 3]])
  {
    const told = estimate(await planOf(`FROM read_tav([${files.map((file) => `'${file}'`)}])`));
    assert.ok(told > count / 4 && told < count * 4, `${told} for ${count}`);
  }
});

test('the engine knows how many rows a table has', async () => {
  const table = `read_tav_table(['${large}', '${small}'], each := '//cpu', columns := {'speed': 'cpuSpeed'})`;
  assert.equal(estimate(await planOf(`FROM ${table}`)), 260_000);
});

test('a join keeps the smaller side in memory, in whichever order they are named', async () => {
  for (const [a, b] of [[large, small], [small, large]])
  {
    const [probed, kept] = joinIn(await planOf(`SELECT count(*) FROM '${a}' AS a JOIN '${b}' AS b ON a.id = b.id`)).children;
    assert.ok(estimate(kept) < 100 && estimate(probed) > 100_000, `${estimate(kept)}, ${estimate(probed)}`);
  }
});

/** How many bytes the process has read so far. */
const read = () => Number(/^rchar: (\d+)$/m.exec(readFileSync('/proc/self/io', 'latin1'))[1]);

// It reads for minutes unless it is ended.
const often = `[${Array(3000).fill(`'${large}'`)}]`;

for (const threads of ['1', '3'])
{
  for (const columns of ['max(ord)', 'max(path)', 'max(text)'])
  {
    test(`a query for ${columns} by ${threads} threads is cancelled`, {timeout: 300_000}, async () => {
      const one = await open({threads});
      let ended;
      const run = one.run(`SELECT ${columns} FROM read_tav(${often})`).then(() => 'rows', (error) => error.message);
      run.then((how) => (ended = how));
      const before = read();
      while (ended === undefined)
      {
        read() - before > 40 << 20 && one.interrupt(); // while it is in a file behind the first
        await new Promise(setImmediate);
      }
      assert.match(ended, /interrupt/i);
      assert.equal(await value(one, `SELECT count(*) FROM '${small}'`), 3n);
    });
  }
}

test('files that differ are one table, by the names of their columns', async () => {
  const other = make(join(work, 'other.tav'), {system: {osName: 'x', cpuOnline: {$type: 'Sint32', $value: -1}}}, '--byte-order', 'big');
  const table = `read_tav_table(['${small}', '${other}'], each := '/system', filename := true,
                                columns := {'os': 'osName', 'cpus': 'cpuOnline', 'host': 'hostName', 'none': 'memTotal'})`;
  assert.deepEqual(await rows(connection, `FROM ${table} ORDER BY filename DESC`), [
    {os: null, cpus: 8n, host: 'ada', none: null, filename: small},
    {os: 'x', cpus: -1n, host: null, none: null, filename: other}]);
  assert.deepEqual(await rows(connection, `SELECT tag, count(*) AS n, count(DISTINCT file) AS files FROM read_tav(['${small}', '${other}'])
                                           WHERE depth = 1 GROUP BY tag ORDER BY tag`),
                   [{tag: 'cpuOnline', n: 2n, files: 2n}, {tag: 'hostName', n: 1n, files: 1n}, {tag: 'osName', n: 1n, files: 1n}]);
});
