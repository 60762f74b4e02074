// The page as `tav view` serves it: the file is there, and is read in ranges.
import assert from "node:assert/strict";
import { spawn } from "node:child_process";
import { once } from "node:events";
import { createInterface } from "node:readline";
import { truncateSync, writeFileSync } from "node:fs";
import { after, before, test } from "node:test";
import { fileURLToPath } from "node:url";
import { click, end, find, made, node, onlyInChromium, rows, settled, start, tab, textOf, visit } from "./browser.mjs";
import { HOST_NAME, SYSTEM, group, hosts, many, text } from "./streams.mjs";

const TOOL = process.env.TAV_TOOL ?? fileURLToPath(new URL("../../build/release/tools/tav", import.meta.url));

const running = [];

before(start);
after(async () => {
  running.forEach((tool) => tool.kill());
  await end();
});

/** Runs `tav view` and opens what it prints. */
async function view(path, hash = "") {
  const tool = spawn(TOOL, ["view", "--no-open", path], { stdio: ["ignore", "pipe", "inherit"] });
  running.push(tool);
  const ended = once(tool, "exit");
  const address = (await once(createInterface(tool.stdout), "line"))[0];
  const page = await visit({ address: address + hash });
  await page.waitForFunction(() => document.body.classList.contains("opened"), { timeout: 60_000 });
  await settled(page);
  return { page, address, ended, tool };
}

test("tav view shows its file, reads it in ranges, and ends with the page", onlyInChromium, async () => {
  const { page, address, ended } = await view(made("a <b> & c.tav", hosts("ada", "grace")), "#path=/system/host%5B2%5D/hostName");
  assert.deepEqual((await rows(page)).map(({ name }) => name), ["system", "host", "host[2]", "hostName", "cpuOnline"]);
  assert.equal((await node(page)).value, "grace");
  assert.match(await textOf(page, "#file"), /^a <b> & c\.tav, \d+ bytes$/);
  await page.waitForFunction(() => [...document.querySelectorAll("#bytes .byte")].every((byte) => byte.textContent !== "··"));
  await find(page, "path", "/system/host/hostName");
  assert.equal((await node(page)).value, "ada");
  assert.deepEqual(page.errors, []);
  const outside = page.requests.filter((asked) => !/^(blob:|data:)/.test(asked));
  assert.ok(outside.length > 2 && outside.every((asked) => asked.startsWith(address)), outside.join());
  await page.close({ runBeforeUnload: true });
  assert.equal((await ended)[0], 0);
});

test("a served page is loaded again, and checks, recovers and compares as one from the disk", onlyInChromium, async () => {
  const { page, ended, tool } = await view(made("served.tav", many(20_000)));
  await page.reload();
  await page.waitForFunction(() => document.body.classList.contains("opened"), { timeout: 60_000 });
  await settled(page);
  await tab(page, "Check");
  await click(page, "#checkRun");
  assert.match(await textOf(page, "#status"), /^20,001 nodes, 0 findings/);
  await find(page, "path", "/system/cpuOnline[19999]");
  assert.equal((await node(page)).value, "19998");
  await tab(page, "Recover");
  await click(page, "#recoverRun");
  assert.equal(await page.$eval("#saveRecovered", (button) => button.hidden), false);
  assert.deepEqual(page.errors, []);
  assert.equal(tool.exitCode, null);
  await page.close({ runBeforeUnload: true });
  assert.equal((await ended)[0], 0);
});

test("a served file that has changed is said to be, until the page is loaded again", onlyInChromium, async () => {
  const path = made("served-changes.tav", many(100_000));
  const { page, ended } = await view(path);
  writeFileSync(path, group(SYSTEM, text(HOST_NAME, "another")));
  await tab(page, "Check");
  await click(page, "#checkRun");
  assert.ok(await page.$eval("#status", (status) => status.classList.contains("bad")));
  await page.reload();
  await page.waitForFunction(() => document.body.classList.contains("opened"), { timeout: 60_000 });
  await find(page, "path", "//hostName");
  assert.equal((await node(page)).value, "another");
  await page.close({ runBeforeUnload: true });
  assert.equal((await ended)[0], 0);
});

test("a served file of 5 GB opens with a few ranges of it", onlyInChromium, async () => {
  const path = made("served-large.tav", hosts("ada"));
  truncateSync(path, 5 * 1024 ** 3);
  const { page, ended } = await view(path);
  assert.equal((await rows(page))[0].name, "system");
  assert.match(await textOf(page, "#file"), /5,?368,?709,?120/);
  await page.close({ runBeforeUnload: true });
  assert.equal((await ended)[0], 0);
});
