// Opens, walks, checks, recovers and closes files in one page for a time, and fails where its memory grows.
//   node test/hour.mjs MINUTES
// Measured after a collection: the page's heap, its elements, and the memory of the module that shows the tree. What the
// first rounds took is the measure, since browsers compile and cache then.
import { end, click, find, made, open, rows, start, tab, visit } from "./browser.mjs";
import { golden, goldenNames, hosts, many } from "./streams.mjs";

const minutes = Number(process.argv[2]);
if (!(minutes > 0)) {
  console.error("usage: node test/hour.mjs MINUTES");
  process.exit(2);
}
const FIRST = 3; // rounds that browsers warm up in
const MORE = 1.25; // times the most of the first rounds, and what the browser itself may take beside that
const OWN = { heap: 2 << 20, elements: 200, module: 0, workers: 0 };

function files() {
  const small = goldenNames().map((name) => made(`${name}.tav`, golden(name)));
  const cut = goldenNames().map((name) => made(`${name}.cut.tav`, golden(name).subarray(0, -3)));
  return [...small, ...cut, made("hosts.tav", hosts("ada", "grace")), made("many.tav", many(50_000))];
}

async function lookAt(page, path) {
  await open(page, path);
  if (await page.$eval("#form", (form) => form.classList.contains("bad"))) {
    return;
  }
  await rows(page);
  await find(page, "text", "a");
  await tab(page, "Check");
  await click(page, "#checkRun");
  await tab(page, "Recover");
  await click(page, "#recoverRun");
}

/** What is there when nothing is to be drawn any more: rows that were in view are garbage until then. */
async function measure(page, session) {
  const found = [];
  for (let i = 0; i < 3; ++i) {
    await page.evaluate(() => new Promise((resolve) => requestAnimationFrame(() => requestAnimationFrame(resolve))));
    found.push(await measureOnce(page, session));
  }
  return Object.fromEntries(Object.keys(found[0]).map((what) => [what, Math.min(...found.map((one) => one[what]))]));
}

async function measureOnce(page, session) {
  await session.send("HeapProfiler.collectGarbage");
  const { metrics } = await session.send("Performance.getMetrics");
  const metric = (wanted) => metrics.find(({ name }) => name === wanted).value;
  return {
    heap: metric("JSHeapUsedSize"),
    elements: metric("Nodes"),
    module: await page.evaluate(() => globalThis.tavPage.engine.memory()),
    workers: page.workers().length,
  };
}

async function main() {
  await start();
  const page = await visit();
  const session = await page.createCDPSession();
  await session.send("Performance.enable");
  await session.send("HeapProfiler.enable");
  const all = files();
  const until = performance.now() + minutes * 60_000;
  const bounds = {};
  const grown = [];
  let round = 0;
  let last;
  for (; round <= FIRST || performance.now() < until; ++round) {
    for (const path of all) {
      await lookAt(page, path);
    }
    last = await measure(page, session);
    for (const [what, value] of Object.entries(last)) {
      if (round < FIRST) {
        bounds[what] = Math.max(bounds[what] ?? 0, value);
      } else if (value > bounds[what] * MORE + OWN[what]) {
        grown.push(`${what}: ${value} in round ${round + 1}, at most ${bounds[what]} in the first ${FIRST}`);
      }
    }
    console.log(`round ${round + 1}: ${JSON.stringify(last)}`);
    if (grown.length > 0) {
      break;
    }
  }
  await end();
  console.log([...grown, `${round * all.length} files in ${round} rounds, ${grown.length === 0 ? "no" : "too much"} growth: ` +
    `at first at most ${JSON.stringify(bounds)}, at last ${JSON.stringify(last)}`].join("\n"));
  return grown.length === 0 ? 0 : 1;
}

process.exit(await main());
