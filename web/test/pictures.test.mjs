// The pictures in docs/browser.md. They are made anew where TAV_PICTURES names a folder.
import { after, before, test } from "node:test";
import { join } from "node:path";
import { click, end, find, made, open, rows, start, tab, visit } from "./browser.mjs";
import { CPU_ONLINE, HOST, HOST_NAME, SYSTEM, group, hosts, number, text, time } from "./streams.mjs";

const target = process.env.TAV_PICTURES;

before(start);
after(end);

async function take(page, name) {
  await rows(page);
  await page.screenshot({ path: join(target, `${name}.png`) });
}

test("pictures for the documents", { skip: target === undefined }, async () => {
  const page = await visit({ width: 1000, height: 640 });
  const bytes = hosts("ada", "grace", "hedy");
  bytes.fill(0xff, bytes.indexOf("grace") - 18, bytes.indexOf("grace") - 15);
  await open(page, made("day.tav", bytes));
  await find(page, "path", "//host[3]/hostName");
  await tab(page, "Check");
  await click(page, "#checkRun");
  await take(page, "browser-check");
  const series = group(SYSTEM, ...Array.from({ length: 60 }, (_, i) => group(HOST, time(974, 1_700_000_000 + 60 * i),
    text(HOST_NAME, "ada"), number(CPU_ONLINE, Math.round(40 + 30 * Math.sin(i / 6))))));
  await open(page, made("series.tav", series));
  await tab(page, "Table");
  await page.$eval("#each", (input) => { input.value = "//host"; });
  await page.$eval("#columns", (input) => { input.value = "when=insert_timestamp\nname=hostName\ncpuOnline"; });
  await click(page, "#tableRun");
  await page.emulateMediaFeatures([{ name: "prefers-color-scheme", value: "dark" }]);
  await take(page, "browser-table");
  await page.close();
});
