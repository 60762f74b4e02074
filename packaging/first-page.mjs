// On a machine that has nothing: the first page of the documents of SQL, or of the page in a browser.
//   node first-page.mjs sql EXTENSION STREAM
//   node first-page.mjs page PAGE STREAM
// The packages that it needs lie in node_modules beside it.
import assert from 'node:assert/strict';
import {pathToFileURL} from 'node:url';

const PATIENCE = 600_000; // ends what hangs

async function sql(extension, stream)
{
  const {DuckDBInstance} = await import('@duckdb/node-api');
  const instance = await DuckDBInstance.create(':memory:', {allow_unsigned_extensions: 'true'});
  const connection = await instance.connect();
  await connection.run(`LOAD '${extension}'`);
  const rowsOf = async (query) => (await connection.runAndReadAll(query)).getRowObjects();
  assert.ok((await rowsOf(`FROM '${stream}' LIMIT 10`)).length > 0);
  const hosts = await rowsOf(
    `SELECT text AS host, count(*) AS times FROM '${stream}' WHERE tag = 'hostName' GROUP BY host ORDER BY host`);
  assert.equal(hosts.length, 1);
  console.log(hosts[0].host, Number(hosts[0].times));
}

async function page(path, stream)
{
  const {default: puppeteer} = await import('puppeteer-core');
  const browser = await puppeteer.launch({executablePath: '/usr/bin/chromium', args: ['--no-sandbox'], timeout: PATIENCE,
                                          protocolTimeout: PATIENCE});
  try
  {
    const tab = await browser.newPage();
    tab.setDefaultTimeout(PATIENCE);
    const errors = [];
    tab.on('pageerror', (error) => errors.push(error.message));
    await tab.goto(pathToFileURL(path).href);
    await (await tab.$('#open')).uploadFile(stream);
    await tab.waitForFunction(() => document.body.getAttribute('aria-busy') === 'false' && document.querySelector('#tree .row .name'));
    const names = await tab.$$eval('#tree .row .name', (all) => all.map((name) => name.textContent));
    assert.equal(names[0], 'system');
    assert.deepEqual(errors, []);
    console.log(names.slice(0, 3).join(' '));
  }
  finally
  {
    await browser.close();
  }
}

const [face, ...paths] = process.argv.slice(2);
await {sql, page}[face](...paths);
