// What goes through a whole file: check, recover, compare, table, own names; and what a click saves.
import assert from "node:assert/strict";
import { after, before, test } from "node:test";
import { click, end, find, isFirefox, longestTask, made, node, onlyInChromium, open, rows, saved, settled, start, tab, textOf, visit } from "./browser.mjs";
import { CPU_ONLINE, HOST, HOST_NAME, SYSTEM, golden, goldenNames, group, hosts, many, number, text, time } from "./streams.mjs";

before(start);
after(end);

const items = (page, list) => page.$$eval(`#${list} [role=listitem]`, (all) => all.map((item) => item.textContent));

async function check(page) {
  await tab(page, "Check");
  await click(page, "#checkRun");
  return items(page, "findings");
}

async function recover(page) {
  await tab(page, "Recover");
  await click(page, "#recoverRun");
  return page.$$eval("#account dt", (names) =>
    Object.fromEntries(names.map((name) => [name.textContent, name.nextElementSibling.textContent])));
}

async function rootForm(page, offset) {
  await find(page, "offset", String(offset));
  return node(page);
}

/** The second of two hosts' names claims more than there is. */
function damaged() {
  const bytes = hosts("ada", "grace", "hedy");
  const at = bytes.indexOf("grace") - 2 - 16;
  bytes.fill(0xff, at, at + 3);
  return { bytes, at };
}

test("checking a sound file finds nothing", async () => {
  const page = await visit();
  await open(page, made("sound.tav", hosts("ada")));
  assert.deepEqual(await check(page), []);
  assert.match(await textOf(page, "#status"), /^4 nodes, 0 findings/);
  await page.close();
});

test("streams in several forms are searched and checked each in its own", async () => {
  const page = await visit();
  const first = golden("nested32");
  const { bytes, at } = damaged();
  await open(page, made("forms.tav", Buffer.concat([first, golden("nested64Big"), bytes])));
  const behind = first.length + golden("nested64Big").length;
  const found = await check(page);
  assert.equal(found.length, 1, found.join("\n"));
  assert.match(found[0], new RegExp(`0x${(behind + at).toString(16)}`));
  await find(page, "path", "//hostName[. = 'hedy']");
  assert.equal((await node(page)).value, "hedy");
  assert.equal((await node(page)).form, (await rootForm(page, behind)).form);
  await find(page, "text", "hedy");
  assert.equal((await node(page)).value, "hedy");
  await page.close();
});

test("a finding leads to its place", async () => {
  const page = await visit();
  const { bytes, at } = damaged();
  await open(page, made("damaged.tav", bytes));
  const found = await check(page);
  assert.match(found.join("\n"), new RegExp(`0x${at.toString(16)}`));
  await find(page, "offset", "0");
  await tab(page, "Check");
  await click(page, `#findings [data-offset="${at}"]`);
  assert.equal((await node(page)).offset, `0x${at.toString(16)}`);
  await page.close();
});

test("recovering accounts for every byte, and what a click saves is sound", async () => {
  const page = await visit();
  const { bytes } = damaged();
  await open(page, made("broken.tav", bytes));
  const account = await recover(page);
  const [, all, kept, lost, unread] = /^(\d+) = (\d+) kept \+ (\d+) lost \+ (\d+) unread$/.exec(account.bytes).map(Number);
  assert.equal(all, bytes.length);
  assert.equal(kept + lost + unread, all);
  assert.ok(lost > 0);
  const file = await saved(page, "#saveRecovered");
  assert.equal(file.name, "broken.recovered.tav");
  assert.equal(file.bytes.length, Number(/^[\d,]+/.exec(account.written)[0].replaceAll(",", "")));
  await open(page, file.path);
  assert.deepEqual(await check(page), []);
  await find(page, "path", "//hostName[.='hedy']");
  assert.equal((await node(page)).value, "hedy");
  await page.close();
});

test("damaged golden files are gone through to their ends", async () => {
  const page = await visit();
  for (const name of goldenNames()) {
    const whole = golden(name);
    for (const [what, harm] of [["cut", (b) => b.subarray(0, b.length - 3)], ["flipped", (b) => {
      b.fill(0xff, 17, 20);
      return b;
    }]]) {
      const bytes = harm(Buffer.from(whole));
      await open(page, made(`${name}.${what}.tav`, bytes));
      if (/no stream/.test(await textOf(page, "#form"))) {
        continue;
      }
      await check(page);
      assert.match(await textOf(page, "#status"), /findings?/, `${name} ${what}`);
      const account = await recover(page);
      assert.equal(Number(/^\d+/.exec(account.bytes)[0]), bytes.length, `${name} ${what}`);
    }
  }
  assert.deepEqual(page.errors, []);
  await page.close();
});

test("two files are compared, and a difference leads to its place", async () => {
  const page = await visit();
  await open(page, made("before.tav", hosts("ada", "grace")));
  const other = hosts("ada", "grace");
  other.writeUInt32LE(77, other.length - 4);
  await tab(page, "Diff");
  await click(page, "#diffRun");
  assert.equal(await textOf(page, "#status"), "there is no other file yet");
  await (await page.$("#other")).uploadFile(made("after.tav", other));
  await click(page, "#diffRun");
  const found = await items(page, "differences");
  assert.equal(found.length, 1);
  assert.match(found[0], /^changed.*\/system\/host\[2\]\/cpuOnline.*9 -> 77$/);
  await click(page, "#differences button");
  assert.equal((await node(page)).path, "/system/host[2]/cpuOnline");
  await (await page.$("#other")).uploadFile(made("same.tav", hosts("ada", "grace")));
  await click(page, "#diffRun");
  assert.equal(await textOf(page, "#status"), "no difference");
  await page.close();
});

test("a table is saved as CSV and drawn over time", async () => {
  const page = await visit();
  const stream = group(SYSTEM, ...[8, 5, 7].map((processors, i) =>
    group(HOST, time(974, 1_700_000_000 + 60 * i), text(HOST_NAME, i === 1 ? 'a,"b"' : "ada"), number(CPU_ONLINE, processors))));
  await open(page, made("series.tav", stream));
  await tab(page, "Table");
  await page.$eval("#each", (input) => { input.value = "//host"; });
  await page.$eval("#columns", (input) => { input.value = "when=insert_timestamp\nname=hostName\ncpuOnline\nosName"; });
  await click(page, "#tableRun");
  assert.equal(await textOf(page, "#status"), "3 rows");
  const lines = await page.$$eval("#plot polyline", (all) => all.map((line) => line.getAttribute("points").split(" ").length));
  assert.deepEqual(lines, [3]);
  assert.ok((await (await page.$("#plot")).boundingBox()).height > 100, "it is seen");
  assert.match(await textOf(page, "#plot"), /2023-11-14T22:13:20/);
  const file = await saved(page, "#saveTable");
  assert.equal(file.name, "series.tav.csv");
  assert.equal(file.bytes.toString(), "when,name,cpuOnline,osName\n" +
    "2023-11-14T22:13:20.000000Z,ada,8,\n" +
    '2023-11-14T22:14:20.000000Z,"a,""b""",5,\n' +
    "2023-11-14T22:15:20.000000Z,ada,7,\n");
  await page.close();
});

test("own names are shown with their units and meaning", async () => {
  const page = await visit();
  await open(page, made("own.tav", group(SYSTEM, number(40001, 7))));
  assert.equal((await rows(page))[1].name, "#40001");
  const names = { 40001: { tag: "queueDepth", kind: "gauge", unit: "jobs", text: "waiting <b>now</b>" } };
  await (await page.$("#names")).uploadFile(made("names.json", JSON.stringify(names)));
  await settled(page);
  await find(page, "path", "//queueDepth");
  const told = await node(page);
  assert.equal(told.meaning, "waiting <b>now</b>");
  assert.equal(told.unit, "jobs");
  await (await page.$("#names")).uploadFile(made("bad.json", '{"40001": 5}'));
  await settled(page);
  assert.match(await textOf(page, "#status"), /line 1/);
  await page.close();
});

test("a node is copied as a path, JSON, C++ and Python", async () => {
  const page = await visit();
  await open(page, made("copies.tav", hosts("ada")));
  await find(page, "path", "//hostName");
  await page.evaluate(() => {
    navigator.clipboard.writeText = async (text) => { globalThis.copied = text; };
  });
  const copied = async (how) => {
    await click(page, `[data-copy=${how}]`);
    return page.evaluate(() => globalThis.copied);
  };
  assert.equal(await copied("path"), "/system/host/hostName");
  assert.deepEqual(JSON.parse((await copied("json")).trim().split("\n").at(-1)).value, "ada");
  assert.match(await copied("cpp"), /document\.find\("\/system\/host\/hostName"\)/);
  assert.match(await copied("python"), /reader\.findall\("\/system\/host\/hostName"\)/);
  await page.close();
});

test("the page answers while a file is checked, says how far it is, and stops", onlyInChromium, async () => {
  const page = await visit();
  await open(page, made("long.tav", many(4_000_000)));
  await tab(page, "Check");
  await page.evaluate(() => {
    const bar = document.querySelector("#progress");
    globalThis.told = new Set();
    new MutationObserver(() => globalThis.told.add(bar.value)).observe(bar, { attributes: true });
  });
  const longest = await longestTask(page, () => click(page, "#checkRun"));
  assert.match(await textOf(page, "#status"), /^4,000,001 nodes, 0 findings/);
  const told = await page.evaluate(() => globalThis.told.size);
  assert.ok(told > 3, `progress was told ${told} times`);
  console.log(`check of 4,000,000 nodes: ${await textOf(page, "#status")}; longest task ${longest} ms`);
  assert.ok(longest < 50, `${longest} ms`);
  await page.evaluate(() => new Promise((resolve) => { // in the page, or it may be over before it is stopped
    const bar = document.querySelector("#progress");
    const watch = new MutationObserver(() => {
      if (bar.value > 0) {
        watch.disconnect();
        document.querySelector("#stop").click();
        resolve();
      }
    });
    watch.observe(bar, { attributes: true });
    document.querySelector("#checkRun").click();
  }));
  await settled(page);
  assert.equal(await textOf(page, "#status"), "stopped");
  await find(page, "offset", "16");
  assert.equal((await node(page)).value, "0");
  await page.close();
});

test("the page answers while a damaged file is recovered and compared", onlyInChromium, async () => {
  const page = await visit();
  const bytes = many(1_000_000);
  for (let at = 5000; at < bytes.length; at += 500_000) {
    bytes.fill(0xff, at, at + 100);
  }
  await open(page, made("torn.tav", bytes));
  let account = {};
  const recovering = await longestTask(page, async () => { account = await recover(page); });
  const [, all, kept, lost] = /^(\d+) = (\d+) kept \+ (\d+) lost/.exec(account.bytes).map(Number);
  assert.equal(all, bytes.length);
  assert.ok(kept > 0 && lost > 0, account.bytes);
  await tab(page, "Diff");
  await (await page.$("#other")).uploadFile(made("whole.tav", many(1_000_000)));
  const comparing = await longestTask(page, () => click(page, "#diffRun"));
  assert.ok((await items(page, "differences")).length > 0);
  console.log(`${account.bytes}; longest task: recovering ${recovering} ms, comparing ${comparing} ms`);
  assert.ok(recovering < 50 && comparing < 50, `${recovering} ms, ${comparing} ms`);
  await page.close();
});

test("the page answers while many places are listed", onlyInChromium, async () => {
  const page = await visit();
  await open(page, made("places.tav", many(100_000)));
  const longest = await longestTask(page, () => find(page, "text", "cpuonline"));
  assert.equal(await textOf(page, "#status"), "the first 10,000 places");
  await page.waitForFunction(() => document.querySelector("#found [role=listitem]").getAttribute("aria-setsize") === "10000");
  assert.ok(longest < 50, `${longest} ms`);
  await page.close();
});

test("files that were opened before leave nothing behind", async () => {
  const page = await visit();
  const path = made("again.tav", many(1000));
  const memory = new Set();
  for (let i = 0; i < 20; ++i) {
    await open(page, path);
    await check(page);
    await recover(page);
    memory.add(await page.evaluate(() => globalThis.tavPage.engine.memory()));
  }
  assert.equal(memory.size, 1);
  await page.waitForFunction(() => true);
  if (!isFirefox) { // where the workers of a page are not told
    assert.equal(page.workers().length, 1, "that of the tree");
  }
  await page.close();
});

test("every change of one byte leaves the page alive", async () => {
  const page = await visit();
  const whole = hosts("ada");
  for (let at = 0; at < whole.length; at += 5) {
    const bytes = Buffer.from(whole);
    bytes[at] ^= 0x81;
    await open(page, made("changed.tav", bytes));
    await rows(page);
  }
  assert.deepEqual(page.errors, []);
  await page.close();
});
