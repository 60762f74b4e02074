// The rows of SQL are those of the Python package, where that is built: with TAV_BUILD_PYTHON, target tav_python.
import assert from 'node:assert/strict';
import {spawnSync} from 'node:child_process';
import {readFileSync, writeFileSync} from 'node:fs';
import {join} from 'node:path';
import {test} from 'node:test';

import {build, folder, golden, goldenNames, open, program, rows, same} from './engine.mjs';

const work = folder();
const connection = await open();
const env = {...process.env, PYTHONPATH: join(build, 'python'), PYTHONDONTWRITEBYTECODE: '1'};
const isThere = spawnSync('/usr/bin/python3', ['-c', 'import tav'], {env}).status === 0;
const skip = isThere ? false : `the Python package is not in ${join(build, 'python')}`;

// Each node as a line of JSON. Numbers are texts, since they can have 128 bits.
const walk = `
import array, json, sys, tav
def plain(text):
    return "\\\\" not in text and not any(0xD800 <= ord(c) < 0xE000 for c in text)
def tell(node):
    value = None if node.is_group else node.value
    is_time = node.type == "UTC Timestamp" and not isinstance(value, bytes)  # an int where Python has no such year
    time = node.time_ns if is_time else None
    print(json.dumps({
        "offset": node.offset, "size": node.size, "id": node.id, "type": node.type, "tag": node.tag, "path": node.path,
        "number": str(value) if isinstance(value, int) and not is_time else None,
        "text": value if isinstance(value, str) and plain(value) else None,
        "bytes": bytes(value).hex() if isinstance(value, (bytes, array.array)) else None,
        "time": time if is_time and time < 2**63 else None}))
with tav.open(sys.argv[1], on_damage="skip") as r:
    for node in r.findall("//*"):
        tell(node)`;

/** Both have the same nodes, names and values. What is no UTF-8 each of them writes in its own way, in SQL with backslashes. */
async function agree(file)
{
  const done = spawnSync('/usr/bin/python3', ['-c', walk, file], {env, maxBuffer: 1 << 28});
  assert.equal(done.status, 0, done.stderr.toString());
  const lines = join(work, 'python.json');
  writeFileSync(lines, done.stdout);
  const columns = `{"offset": 'UBIGINT', "size": 'UBIGINT', "id": 'USMALLINT', "type": 'VARCHAR', "tag": 'VARCHAR', "path": 'VARCHAR',
                    "number": 'VARCHAR', "text": 'VARCHAR', "bytes": 'VARCHAR', "time": 'BIGINT'}`;
  const plain = (text) => `CASE WHEN NOT contains(${text}, '\\') THEN ${text} END`;
  const own = `SELECT "offset", size, id, type, tag, path, coalesce(number::VARCHAR, CASE WHEN type = 'Uint128' THEN text END) AS number,
                      CASE WHEN type <> 'Uint128' THEN ${plain('text')} END AS text, lower(hex(bytes)) AS bytes, epoch_ns(time) AS time
               FROM read_tav('${file}', on_damage := 'skip')`;
  const python = `SELECT "offset", size, id, type, tag, path, number, ${plain('text')} AS text, bytes, time
                  FROM read_json('${lines}', format = 'newline_delimited', columns = ${columns})`;
  return await same(connection, own, python);
}

test('golden vectors', {skip}, async () => {
  const file = join(work, 'golden.tav');
  for (const name of goldenNames)
  {
    writeFileSync(file, golden(name));
    assert.ok(await agree(file) > 0, name);
  }
});

test('random trees, whole and damaged, and several forms in one file', {skip}, async () => {
  const file = join(work, 'random.tav');
  const parts = [];
  for (const form of [[], ['--swap', '--align'], ['--root32', '--strings'], ['--mixed', '--pairs'], ['--utf8']])
  {
    for (let seed = 1; seed <= 2; ++seed)
    {
      program('tests/system/tools/tav_generate', [file, '--seed', `${seed}`, '--nodes', '200', ...form], {status: 0});
      assert.ok(await agree(file) > 0);
      const bytes = readFileSync(file);
      parts.push(Buffer.from(bytes));
      bytes.fill(0xee, Math.floor(bytes.length * seed / 3), Math.floor(bytes.length * seed / 3) + 9);
      writeFileSync(file, bytes);
      await agree(file);
    }
  }
  writeFileSync(file, Buffer.concat(parts));
  assert.ok(await agree(file) > 500);
});
