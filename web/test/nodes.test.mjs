// The module against the program: one stream has the same nodes by both. What the program tells is held against the
// operations, the layer and the C interface elsewhere.
import assert from "node:assert/strict";
import { execFileSync } from "node:child_process";
import { after, before, test } from "node:test";
import { join } from "node:path";
import { fileURLToPath } from "node:url";
import { end, folder, made, open, start, visit } from "./browser.mjs";
import { golden, goldenNames } from "./streams.mjs";

const built = (name) => fileURLToPath(new URL(`../../build/release/${name}`, import.meta.url));
const TOOL = process.env.TAV_TOOL ?? built("tools/tav");
const GENERATE = process.env.TAV_GENERATE ?? built("tests/system/tools/tav_generate");

before(start);
after(end);

/** The module's JSON of every root, and of all below it, a line a node. */
const linesOfModule = (page) => page.evaluate(async () => {
  const { engine } = globalThis.tavPage;
  let level;
  do {
    ({ level } = await engine.call("tavCount", { numbers: [0] }));
  } while (!level.done);
  const lines = [];
  for (let row = 0; row < level.rows; ++row) {
    const { json } = await engine.call("tavJson", { numbers: [0, BigInt(row)] });
    lines.push(...json.trimEnd().split("\n").slice(row === 0 ? 0 : 1)); // the first line says the form
  }
  return lines;
});

function linesOfProgram(path, options = []) {
  const out = execFileSync(TOOL, ["json", "--lines", path, ...options], { encoding: "utf8", maxBuffer: 1 << 28 });
  return out.trimEnd().split("\n");
}

/** Holds the file that the page has against the program, which is told the form that the page took. */
async function expectSame(page, path, what) {
  const { order, bits, padded } = await page.evaluate(() => globalThis.tavPage.engine.opened.form);
  const form = ["--byte-order", order.replace("-endian", ""), "--root", String(bits), padded ? "--align" : "--no-align"];
  const lines = await linesOfModule(page);
  assert.deepEqual(lines, linesOfProgram(path, form), what);
  return lines.length - 1;
}

/** Opens the file anew as it was written: a short stream can be read in more than one way. */
const openAs = (page, ...numbers) => page.evaluate(async (form) => {
  const { given, engine } = globalThis.tavPage;
  engine.opened = await engine.call("tavOpen", { texts: [given.name, ""], numbers: form });
}, numbers);

test("the golden files have the same nodes as by the program", async () => {
  const page = await visit();
  let nodes = 0;
  for (const name of goldenNames()) {
    const path = made(`${name}.tav`, golden(name));
    await open(page, path);
    nodes += await expectSame(page, path, name);
  }
  assert.ok(nodes > 3 * goldenNames().length, `${nodes} nodes`);
  await page.close();
});

test("random streams in every form have the same nodes as by the program", async () => {
  const kinds = [["--pairs"], ["--pairs", "--mixed"], ["--wild", "--pairs", "--mixed"], ["--utf8"]];
  const page = await visit();
  let nodes = 0;
  let seed = 0;
  for (const order of [1, 2]) {
    for (const bits of [1, 2]) {
      for (const padding of [1, 2]) {
        for (const kind of kinds) {
          const path = join(folder, `random${++seed}.tav`);
          const options = [...order === 2 ? ["--swap"] : [], ...bits === 1 ? ["--root32"] : [], ...padding === 2 ? ["--align"] : []];
          execFileSync(GENERATE, [path, ...kind, ...options, "--seed", String(seed), "--nodes", "60"], { stdio: "pipe" });
          await open(page, path);
          await openAs(page, order, bits, padding);
          const count = await expectSame(page, path, [...kind, ...options, seed].join(" "));
          assert.ok(count >= 60, `${count} nodes of ${path}`);
          nodes += count;
        }
      }
    }
  }
  console.log(`${seed} random streams, ${nodes} nodes, the same by the module and by the program`);
  await page.close();
});
