// The types of a table's columns, by any number of threads.
import assert from 'node:assert/strict';
import {readFileSync, writeFileSync} from 'node:fs';
import {join} from 'node:path';
import {test} from 'node:test';

import {folder, make, open, program, rows} from './engine.mjs';

const work = folder();
const least = 16 << 20; // bytes that a file has which several threads read
const threads = [1, 2, 3, 4, 5, 6, 7, 8];
const engines = await Promise.all(threads.map((count) => open({threads: `${count}`})));

function table(files, each, columns, more = '')
{
  const names = Object.entries(columns).map(([name, path]) => `'${name}': '${path}'`);
  return `read_tav_table([${files.map((file) => `'${file}'`)}], each := '${each}', columns := {${names}}${more})`;
}

const types = async (engine, from) => (await rows(engine, `DESCRIBE FROM ${from}`)).map((row) => row.column_type);

/** The types, or the message, are those of one thread, by the number that is asked for; the rows, too, by the engine's. */
async function agree(files, each, columns, how)
{
  const from = (more) => table(files, each, columns, `, on_damage := '${how}', filename := true${more}`);
  const told = (error) => ({message: error.message.split('\n')[0]}); // behind it is where in the query
  const one = await types(engines[0], from('')).then((found) => ({types: found}), told);
  for (const count of threads)
  {
    assert.deepEqual(await types(engines[0], from(`, threads := ${count}`)).then((found) => ({types: found}), told), one, `${count} threads`);
  }
  const all = async (engine) => (await rows(engine, `SELECT count(*) AS n, sum(hash(t)) AS sum FROM ${from('')} AS t`))[0];
  const whole = one.message === undefined ? await all(engines[0]) : undefined;
  for (const i of [1, 2, 7])
  {
    assert.deepEqual(await all(engines[i]).catch(told), whole ?? one, `an engine of ${threads[i]} threads`);
  }
  return {...one, all: whole};
}

/** Random streams of all forms, one behind the other, as many times as make a large file. */
function mixed(seed, damages)
{
  const part = join(work, 'part.tav');
  const parts = [];
  for (const form of [[], ['--swap'], ['--align', '--pairs'], ['--root32', '--strings'], ['--utf8', '--swap', '--align'], ['--mixed']])
  {
    program('tests/system/tools/tav_generate', [part, '--seed', `${seed}`, '--nodes', '3000', ...form], {status: 0});
    parts.push(readFileSync(part));
  }
  const once = Buffer.concat(parts);
  const bytes = Buffer.concat(Array(Math.ceil((least + 1) / once.length)).fill(once));
  for (let i = 1; i <= damages; ++i)
  {
    bytes.fill(0xee, Math.floor(bytes.length * i / (damages + 1)), Math.floor(bytes.length * i / (damages + 1)) + 30);
  }
  const file = join(work, `mixed${seed}.tav`);
  writeFileSync(file, bytes);
  return file;
}

for (const [seed, damages] of [[1, 0], [2, 1], [3, 9]])
{
  test(`a large file of random streams with ${damages} damages`, async () => {
    const file = mixed(seed, damages);
    const [each, columns] = damages === 1 ? ['/*', {first: '*', deep: '*/*'}] : ['/*/*', {own: '.', below: '*'}];
    assert.ok((await agree([file], each, columns, 'skip')).all.n > 0n);
    const stopped = await agree([file], each, columns, 'stop');
    assert.ok(damages === 0 || stopped.message !== undefined);
  });
}

test('one value anywhere in a large file decides', async () => {
  const host = {hostName: 'a name of some length', cpuOnline: 8};
  const plain = readFileSync(make(join(work, 'plain.tav'), {system: {host: Array(80_000).fill(host)}}));
  const odd = readFileSync(make(join(work, 'odd.tav'), {system: {host: {hostName: 7, cpuOnline: {$type: 'Sint32', $value: -1}}}}));
  const file = join(work, 'decides.tav');
  const times = Math.ceil((least + 1) / plain.length);
  for (let place = 0; place <= times; ++place)
  {
    const parts = Array(times).fill(plain);
    parts.splice(place, 0, odd);
    writeFileSync(file, Buffer.concat(parts));
    for (const i of [0, 1, 4])
    {
      const from = table([file], '//host', {name: 'hostName', cpus: 'cpuOnline'});
      assert.deepEqual(await types(engines[i], from), ['VARCHAR', 'BIGINT'], `place ${place}, ${threads[i]} threads`);
    }
  }
});

test('large files and small ones among each other', async () => {
  const value = (i) => [i, {$type: 'Sint32', $value: -i}, `text ${i}`, {$type: 'Uint128', $value: `${(2n ** 127n) + BigInt(i)}`}][i % 4];
  const small = Array.from({length: 40}, (_, i) => make(join(work, `small${i}.tav`), {system: {cpuOnline: i, osName: value(i), hostName: 'ada'}}));
  const large = make(join(work, 'large.tav'), {system: Array.from({length: 400}, (_, i) => ({cpuOnline: {$type: 'Sint64', $value: -i}, hostName: 'x'.repeat(45_000)}))});
  assert.ok(readFileSync(large).length > least);
  const columns = {cpus: 'cpuOnline', os: 'osName', name: 'hostName'};
  const whole = await agree([...small.slice(0, 20), large, ...small.slice(20)], '/system', columns, 'stop');
  assert.equal(whole.all.n, 440n);
  assert.deepEqual(whole.types, ['BIGINT', 'VARCHAR', 'VARCHAR', 'VARCHAR']);
  assert.deepEqual((await agree(small.filter((_, i) => i % 4 === 0), '/system', columns, 'stop')).types.slice(0, 2), ['UBIGINT', 'UBIGINT']);
  assert.deepEqual((await agree(small.filter((_, i) => i % 4 < 2), '/system', columns, 'stop')).types.slice(0, 2), ['UBIGINT', 'BIGINT']);
});

test('of several files that cannot be read the first is told', async () => {
  const good = Array.from({length: 12}, (_, i) => make(join(work, `good${i}.tav`), {system: {cpuOnline: i}}));
  const bytes = readFileSync(good[0]);
  bytes.fill(0xee, 20, 30);
  const bad = ['first.tav', 'second.tav'].map((name) => join(work, name));
  bad.forEach((name) => writeFileSync(name, bytes));
  const large = mixed(4, 2);
  for (const files of [[...good, ...bad], [good[0], bad[0], large, bad[1]], [bad[0], ...good, bad[1], large]])
  {
    assert.match((await agree(files, '/system', {cpus: 'cpuOnline'}, 'stop')).message, /first\.tav: 0x/);
  }
  assert.match((await agree([...good, large, ...bad], '/system', {cpus: 'cpuOnline'}, 'stop')).message, /mixed4\.tav: 0x/);
});

test('a number of threads that makes no sense is told', async () => {
  const file = make(join(work, 'told.tav'), {system: {cpuOnline: 1}});
  for (const count of [0, -1])
  {
    await assert.rejects(rows(engines[0], `FROM ${table([file], '/system', {a: 'cpuOnline'}, `, threads := ${count}`)}`), /threads is 1 or more/);
  }
});
