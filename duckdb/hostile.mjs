// What duckdb/hostile.sh runs: each input ends in rows or in a message of the extension; a sanitizer ends the process.
import assert from 'node:assert/strict';
import {readFileSync, readdirSync, writeFileSync} from 'node:fs';
import {join} from 'node:path';

import {folder, golden, goldenNames, open, root} from './tests/engine.mjs';

const file = join(folder(), 'hostile.tav');
const connections = [await open({threads: '1'}), await open({threads: '3'})];
const columns = `{'own': '.', 'below': '*', 'deep': '*//*', 'above': '../hostName'}`;
let random = 1;
const next = (limit) => (random = (random * 48271) % 2147483647) % limit;
let inputs = 0;
let read = 0;

/** All of the columns of both functions. */
async function look(bytes)
{
  writeFileSync(file, bytes);
  const how = `on_damage := '${['stop', 'skip'][inputs % 2]}'`;
  const form = inputs % 5 === 0 ? `, byte_order := '${['little', 'big'][next(2)]}', root := ${[32, 64][next(2)]}, align := ${next(2) === 1}` : '';
  const join = inputs % 3 === 0 ? `, join := ','` : '';
  for (const from of [`read_tav('${file}', ${how}${form})`,
                      `read_tav_table('${file}', each := '//*', columns := ${columns}, ${how}${form}${join})`])
  {
    const rows = connections[inputs % 2].runAndReadAll(`SELECT *, hash(COLUMNS(*)) FROM ${from}`);
    read += await rows.then(() => 1, (error) => assert.match(error.message, /hostile\.tav/) ?? 0);
  }
  ++inputs;
}

for (const kind of ['corpus', 'findings'])
{
  for (const target of readdirSync(join(root, 'fuzz', kind)))
  {
    for (const name of readdirSync(join(root, 'fuzz', kind, target)))
    {
      await look(readFileSync(join(root, 'fuzz', kind, target, name)));
    }
  }
}
for (const name of goldenNames)
{
  for (let round = 0; round < Number(process.argv[2]); ++round)
  {
    const bytes = golden(name);
    for (let i = 0; i < round % 6; ++i)
    {
      bytes[next(bytes.length)] = [0, 0xff, 0x80, next(256)][next(4)];
    }
    const doubled = round % 4 === 1 ? Buffer.concat([bytes, golden(goldenNames[next(goldenNames.length)])]) : bytes;
    await look(doubled.subarray(0, round % 3 === 0 ? next(doubled.length) + 1 : doubled.length));
  }
}
assert.ok(read > inputs / 10 && read < 2 * inputs, `${read} of ${2 * inputs} queries gave rows`);
console.log(`${inputs} inputs, ${read} of ${2 * inputs} queries gave rows, the others a message`);
