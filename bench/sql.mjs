#!/usr/bin/env node
// What queries cost, beside the pass over the nodes alone and the engine's own readers: medians, and ratios of one run.
//
//   bench/sql.mjs [BUILD]     BUILD/duckdb, BUILD/tools/tav and BUILD/python are there; build/release unless given
//
// A million leaves, and a file of more than 100 MB; rounds take turns, so that what disturbs the machine disturbs all. What one
// thread does is measured in time of the processor, what two do by the clock: that wants a machine with nothing else to do.
import {spawnSync} from 'node:child_process';
import {mkdtempSync, rmSync, statSync, writeFileSync} from 'node:fs';
import {tmpdir} from 'node:os';
import {join, resolve} from 'node:path';

process.env.TAV_BUILD = resolve(process.argv[2] ?? 'build/release');
const {make, open, program} = await import('../duckdb/tests/engine.mjs');

const rounds = 5;
const work = mkdtempSync(join(tmpdir(), 'tav-bench-'));
process.on('exit', () => rmSync(work, {recursive: true, force: true}));

/** A root with so many hosts of 24,000 leaves. */
function stream(name, hosts)
{
  const cpu = {cpuOnline: 8, cpuSpeed: 7919, hostName: 'ada', cpuConfig: 3};
  const host = {cpu: Array(6000).fill(cpu)};
  return make(join(work, name), {system: {host: Array(hosts).fill(host)}});
}

const million = stream('million.tav', 42);
const big = stream('big.tav', 240);
const lines = join(work, 'lines.json');
const csv = join(work, 'table.csv');
writeFileSync(lines, program('tools/tav', ['json', '--lines', million]));
writeFileSync(csv, program('tools/tav', ['table', million, '--each', '//cpu', '--col', 'cpuSpeed', '--col', 'hostName']));
const one = await open({threads: '1'});
const two = await open({threads: '2'});

const table = `read_tav_table('${million}', each := '//cpu', columns := {'a': 'cpuSpeed', 'b': 'hostName'})`;
const wide = `read_tav_table('${big}', each := '//cpu', columns := {'a': 'cpuSpeed', 'b': 'hostName'})`;
const json = `read_json('${lines}', format = 'newline_delimited', columns = {"path": 'VARCHAR', "element": 'VARCHAR', "value": 'JSON'})`;
await one.run(`CREATE TABLE kept AS SELECT path, tag FROM '${million}'`);
// A group for each leaf; of the groups one row is handed out, since what JavaScript makes of a million rows is its own.
const grouped = (from) => `SELECT count(*), max(n) FROM (SELECT path, tag, count(*) AS n FROM ${from} GROUP BY ALL)`;
const queries = {
  'count of nodes': [one, `SELECT count(*) FROM '${million}'`],
  'count of nodes, JSON lines': [one, `SELECT count(*) FROM ${json}`],
  'sum by tag': [one, `SELECT tag, count(*), sum(number) FROM '${million}' GROUP BY tag`],
  'group by path and tag': [one, grouped(`'${million}'`)],
  'group by path and tag, of a table': [one, grouped('kept')],
  'group by path and tag, JSON lines': [one, grouped(`(SELECT path, element AS tag FROM ${json})`)],
  'mean of a column': [one, `SELECT avg(a), count(b) FROM ${table}`],
  'mean of a column, CSV': [one, `SELECT avg(cpuSpeed), count(hostName) FROM '${csv}'`],
  'sum of 100 MB, one thread': [one, `SELECT tag, sum(number) FROM '${big}' GROUP BY tag`],
  'sum of 100 MB, two threads': [two, `SELECT tag, sum(number) FROM '${big}' GROUP BY tag`],
  'table of 100 MB, one thread': [one, `SELECT avg(a), count(b) FROM ${wide}`],
  'table of 100 MB, two threads': [two, `SELECT avg(a), count(b) FROM ${wide}`],
};
const seconds = Object.fromEntries(Object.keys(queries).map((name) => [name, []]));
seconds['pass over the columns'] = [];
for (let round = 0; round < rounds; ++round)
{
  for (const [name, [connection, sql]] of Object.entries(queries))
  {
    const start = process.hrtime.bigint();
    const busy = process.cpuUsage();
    await connection.runAndReadAll(sql);
    const {user, system} = process.cpuUsage(busy);
    const byClock = name.includes('of 100 MB');
    seconds[name].push(byClock ? Number(process.hrtime.bigint() - start) / 1e9 : (user + system) / 1e6);
  }
  const pass = spawnSync('/usr/bin/python3', ['-c', `
import sys, time, tav
with tav.open(sys.argv[1]) as r:
    start = time.process_time()
    r._columns()
    print(time.process_time() - start)`, million], {env: {...process.env, PYTHONPATH: join(process.env.TAV_BUILD, 'python')}});
  seconds['pass over the columns'].push(Number(pass.stdout.toString()));
}
const median = (name) => seconds[name].toSorted((a, b) => a - b)[rounds >> 1];
console.log(`${(statSync(million).size / 1e6).toFixed(0)} MB and ${(statSync(big).size / 1e6).toFixed(0)} MB`);
for (const name of Object.keys(seconds))
{
  console.log(`${name.padEnd(36)} ${(median(name) * 1000).toFixed(0).padStart(7)} ms`);
}
const ratio = (what, a, b, bound) => console.log(`${what}: ${(median(a) / median(b)).toFixed(2)} (${bound})`);
ratio('count to the pass over the columns', 'count of nodes', 'pass over the columns', 'at most 2');
ratio('one thread to two, nodes', 'sum of 100 MB, one thread', 'sum of 100 MB, two threads', 'at least 1.7');
ratio('one thread to two, table', 'table of 100 MB, one thread', 'table of 100 MB, two threads', 'at least 1.7');
ratio('JSON lines to nodes, count', 'count of nodes, JSON lines', 'count of nodes', 'beside');
ratio('CSV to table', 'mean of a column, CSV', 'mean of a column', 'beside');
const groups = ['group by path and tag', 'group by path and tag, of a table'].map(median);
console.log(`group by path and tag: ${groups[0].toFixed(2)} s (at most 0.2), of which the engine's own are ${groups[1].toFixed(2)} s`);
