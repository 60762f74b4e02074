// Looking into a file: tree, values, bytes, form, finding, keys.
import assert from "node:assert/strict";
import { after, before, test } from "node:test";
import { readFileSync, truncateSync, utimesSync, writeFileSync } from "node:fs";
import { createServer } from "node:http";
import { click, end, find, isFirefox, made, node, onlyInChromium, open, rows, settled, start, textOf, visit } from "./browser.mjs";
import { HOST_NAME, SYSTEM, golden, goldenNames, group, hosts, many, text } from "./streams.mjs";

before(start);
after(end);

test("a file's tree is shown, its values by type", async () => {
  const page = await visit();
  await open(page, made("hosts.tav", hosts("ada", "grace")));
  assert.deepEqual((await rows(page)).map(({ name }) => name), ["system", "host", "host[2]"]);
  await find(page, "path", "/system/host[2]/hostName");
  assert.equal((await node(page)).value, "grace");
  assert.equal((await node(page)).path, "/system/host[2]/hostName");
  const selected = (await rows(page)).find((row) => row.selected);
  assert.deepEqual(selected, { name: "hostName", type: "UTF8 String", value: '"grace"', selected: true });
  assert.deepEqual(page.errors, []);
  await page.close();
});

test("the golden files open, and say of themselves what they are", async () => {
  const page = await visit();
  for (const name of goldenNames()) {
    await open(page, made(`${name}.tav`, golden(name)));
    assert.match(await textOf(page, "#form"), /-endian, (32|64)-bit root header/, name);
    assert.ok((await rows(page)).length > 0, name);
  }
  assert.deepEqual(page.errors, []);
  await page.close();
});

test("a node shows its bytes, and a byte its node", async () => {
  const page = await visit();
  await open(page, made("linked.tav", hosts("ada")));
  await find(page, "path", "//hostName");
  const part = (kind) => page.$$eval(`#bytes .${kind}`, (all) => all.map((byte) => byte.textContent).join(""));
  await page.waitForFunction(() => [...document.querySelectorAll("#bytes .byte")].every((byte) => byte.textContent !== "··"));
  assert.equal(await part("payload"), "b804616461");
  assert.equal(await part("header"), "0500000000000000000000006600c7ea");
  await click(page, '#bytes [data-offset="72"]'); // in the value of cpuOnline
  assert.equal((await node(page)).path, "/system/host/cpuOnline");
  assert.equal((await node(page)).value, "8");
  await page.close();
});

test("a form that is given is taken, and another one is found out again", async () => {
  const page = await visit();
  await open(page, made("form.tav", hosts("ada")));
  assert.equal(await textOf(page, "#form"), "little-endian, 64-bit root header, not padded");
  assert.ok((await page.$$eval("#because li", (all) => all.length)) > 0);
  await page.select("#padding", "2");
  await settled(page);
  assert.equal(await textOf(page, "#form"), "little-endian, 64-bit root header, padded to 8");
  await page.select("#padding", "0");
  await page.select("#order", "2");
  await settled(page);
  assert.equal(await textOf(page, "#form"), "this is no stream, or nothing of it is whole");
  await page.select("#order", "0");
  await settled(page);
  assert.equal(await textOf(page, "#form"), "little-endian, 64-bit root header, not padded");
  await page.close();
});

test("finding by text, by bytes and by offset leads to the place", async () => {
  const page = await visit();
  await open(page, made("find.tav", hosts("ada", "Grace", "hedy")));
  await find(page, "text", "GRACE");
  assert.equal((await node(page)).value, "Grace");
  await find(page, "bytes", "68 65 64 79");
  assert.equal((await node(page)).value, "hedy");
  await find(page, "offset", "0x10");
  assert.equal((await node(page)).path, "/system/host");
  await find(page, "path", "/system/host");
  const places = () => page.$$eval("#found .place", (all) => all.map((place) => [...place.children].map((part) => part.textContent)));
  assert.deepEqual((await places())[0], ["/system/host", "group"]);
  await find(page, "bytes", "68 65 64 79");
  assert.equal((await places())[0][1], "4 bytes");
  await find(page, "path", "//hostNam");
  assert.match(await textOf(page, "#status"), /hostName/, "the nearest name is told");
  await find(page, "offset", "99999");
  assert.equal(await textOf(page, "#status"), "99999 is no offset in this file");
  await page.close();
});

test("streams in several forms are read each in its own", async () => {
  const page = await visit();
  const both = Buffer.concat([golden("nested32"), golden("nested64Big")]);
  await open(page, made("two.tav", both));
  const names = (await rows(page)).map(({ name }) => name);
  await find(page, "offset", String(golden("nested32").length));
  assert.match((await node(page)).form, /^big-endian, 64-bit/, names.join());
  await page.close();
});

test("names and values from a stream are text", async () => {
  const page = await visit();
  const hostile = '<img src=x onerror="document.title=\'had\'"><script>document.title="had"</script>\u202e\u0000';
  await open(page, made("<img src=x>.tav", group(SYSTEM, text(HOST_NAME, hostile), text(HOST_NAME, "</script><b>"))));
  await find(page, "text", "onerror");
  assert.ok((await node(page)).value.startsWith("<img src=x onerror="));
  assert.equal(await page.$$eval("img, b, body script:not(#worker, #module)", (all) => all.length), 1, "the page's own");
  assert.notEqual(await page.title(), "had");
  assert.deepEqual(page.errors, []);
  await page.close();
});

test("everything in the tree is reached by keys, and said to screen readers", async () => {
  const page = await visit();
  await open(page, made("keys.tav", hosts("ada", "grace")));
  await page.focus("#tree");
  await page.keyboard.press("ArrowDown");
  await page.waitForFunction(() => document.querySelector("#node dd").textContent === "/system/host");
  await page.keyboard.press("ArrowRight");
  await page.waitForFunction(() => document.querySelectorAll("#tree .row").length === 5);
  await page.keyboard.press("ArrowRight");
  await page.waitForFunction(() => document.querySelector("#node").textContent.includes("/system/host/hostName"));
  const active = await page.$eval("#tree", (tree) => document.getElementById(tree.getAttribute("aria-activedescendant")).outerHTML);
  assert.match(active, /role="treeitem" aria-level="3" aria-posinset="1" aria-setsize="2" aria-selected="true"/);
  await page.keyboard.press("ArrowLeft");
  await page.waitForFunction(() => document.querySelector("#node dd").textContent === "/system/host");
  await page.keyboard.press("ArrowLeft");
  await page.waitForFunction(() => document.querySelectorAll("#tree .row").length === 3);
  await page.close();
});

test("places in a list are reached by keys, those out of view, too", async () => {
  const page = await visit();
  await open(page, made("places.tav", many(3000)));
  await find(page, "text", "cpuOnline");
  await page.focus("#found");
  await page.keyboard.press("End");
  await page.waitForFunction(() => document.activeElement.closest("[role=listitem]")?.getAttribute("aria-posinset") === "3000");
  await page.keyboard.press("ArrowUp");
  await page.waitForFunction(() => document.activeElement.closest("[role=listitem]")?.getAttribute("aria-posinset") === "2999");
  await page.keyboard.press("Enter");
  await page.waitForFunction(() => document.querySelector("#node dd").textContent === "/system/cpuOnline[2999]");
  await page.keyboard.press("Home");
  await page.waitForFunction(() => document.activeElement.closest("[role=listitem]")?.getAttribute("aria-posinset") === "1");
  await page.close();
});

test("keys go through the bytes, and screen readers are told which", async () => {
  const page = await visit();
  await open(page, made("bytes.tav", hosts("ada")));
  await page.focus("#bytes");
  await page.waitForFunction(() => document.querySelector("#bytes .byte")?.textContent !== "··");
  for (const [key, offset] of [["ArrowDown", "16"], ["ArrowRight", "17"], ["ArrowLeft", "16"]]) {
    await page.keyboard.press(key);
    const active = await page.$eval("#bytes", (grid) => {
      const cell = document.getElementById(grid.getAttribute("aria-activedescendant"));
      return { offset: cell.dataset.offset, role: cell.getAttribute("role"), selected: cell.getAttribute("aria-selected") };
    });
    assert.deepEqual(active, { offset, role: "gridcell", selected: "true" });
  }
  await page.keyboard.press("Enter");
  await page.waitForFunction(() => document.querySelector("#node dd").textContent === "/system/host");
  await page.close();
});

test("a million siblings scroll", async () => {
  const page = await visit();
  await open(page, made("million.tav", many(1_000_000)));
  await page.focus("#tree");
  await page.waitForFunction(() => document.querySelector("#tree [aria-level='2']")?.getAttribute("aria-setsize") === "1000000",
    { polling: 100 });
  await page.keyboard.press("End");
  await page.waitForFunction(() => document.querySelector("#node").textContent.includes("999999"));
  assert.equal((await node(page)).path, "/system/cpuOnline[1000000]");
  assert.ok((await page.$$eval("#tree .row", (all) => all.length)) < 100);
  await find(page, "offset", String(16 + 20 * 500_000));
  assert.equal((await node(page)).value, "500000");
  await page.close();
});

test("a file of 5 GB opens by few of its bytes, in little memory", async () => {
  const page = await visit();
  await page.evaluate(() => { // a worker reads, which counts from now on what it takes
    document.getElementById("worker").prepend(`
      globalThis.taken = 0;
      const takeSlice = Blob.prototype.slice;
      Blob.prototype.slice = function (begin, end) {
        globalThis.taken += end - begin;
        return takeSlice.call(this, begin, end);
      };`);
  });
  const path = made("sparse.tav", Buffer.concat([hosts("ada"), hosts("grace")]));
  truncateSync(path, 5 * 1024 ** 3);
  const begun = performance.now();
  await open(page, path);
  const took = performance.now() - begun;
  assert.equal((await rows(page))[0].name, "system");
  let taken = 0;
  if (!isFirefox) { // where no test can look into a worker
    taken = await page.workers().at(-1).evaluate(() => globalThis.taken);
    assert.ok(taken > 0 && taken <= 64 * 1024 ** 2, `${taken} bytes were read`);
  }
  const memory = await page.evaluate(() => globalThis.tavPage.engine.memory());
  assert.ok(memory <= 64 * 1024 ** 2, `${memory} bytes`);
  console.log(`5 GB: opened in ${took.toFixed(0)} ms by ${taken} bytes, module memory ${memory} bytes`);
  await page.close();
});

test("a file that was changed since it was opened is said to be", async () => {
  const page = await visit();
  const path = made("changes.tav", many(100_000));
  await open(page, path);
  writeFileSync(path, hosts("ada"));
  const later = Date.now() / 1000 + 10; // times of files count seconds in some systems
  utimesSync(path, later, later);
  await click(page, "#checkRun");
  assert.ok(await page.$eval("#status", (status) => status.classList.contains("bad")));
  await page.close();
});

test("the page asks for nothing but itself", async () => {
  const page = await visit();
  await open(page, made("quiet.tav", hosts("ada")));
  const outside = page.requests.filter((address) => !/^(blob:|data:)/.test(address) && address !== page.url());
  assert.deepEqual(outside, []);
  assert.ok(isFirefox || page.requests.includes(page.url()), "requests are seen"); // Firefox tells of none from a disk
  const refused = await page.evaluate(async () => {
    const told = new Promise((resolve) => addEventListener("securitypolicyviolation",
      ({ effectiveDirective, blockedURI }) => resolve({ effectiveDirective, blockedURI })));
    const error = await fetch("http://127.0.0.1:9/").then(() => "connected", String);
    return { error, ...await told };
  });
  assert.match(refused.error, /TypeError/);
  assert.equal(refused.effectiveDirective, "connect-src");
  assert.equal(refused.blockedURI, "http://127.0.0.1:9/");
  await page.close();
});

test("a link to a path of a served page leads there", async () => {
  const server = createServer((_, answer) => {
    answer.setHeader("content-type", "text/html");
    answer.end(readFileSync(new URL("../dist/tav.html", import.meta.url)));
  });
  await new Promise((resolve) => server.listen(0, "127.0.0.1", resolve));
  const page = await visit({ address: `http://127.0.0.1:${server.address().port}/#path=/system/host%5B2%5D/hostName` });
  await open(page, made("link.tav", hosts("ada", "grace")));
  assert.equal((await node(page)).value, "grace");
  await page.evaluate(() => { location.hash = "#path=/system/host/cpuOnline"; });
  await page.waitForFunction(() => document.querySelector("#node dd").textContent === "/system/host/cpuOnline");
  await page.close();
  server.close();
});

test("on a telephone nothing is cut off", async () => {
  const page = await visit({ width: 375, height: 667 });
  await open(page, made("phone.tav", hosts("ada")));
  assert.ok(await page.evaluate(() => document.documentElement.scrollWidth <= innerWidth));
  await page.close();
});

test("colours follow the system", onlyInChromium, async () => {
  const page = await visit();
  const colour = () => page.evaluate(() => getComputedStyle(document.body).backgroundColor);
  await page.emulateMediaFeatures([{ name: "prefers-color-scheme", value: "light" }]);
  const light = await colour();
  await page.emulateMediaFeatures([{ name: "prefers-color-scheme", value: "dark" }]);
  assert.notEqual(await colour(), light);
  await page.close();
});
