// What validating and walking 100 MB in memory costs as WebAssembly beside the same source as native code: builds both, runs
// them in turns and prints the medians of the rounds, and their ratio.
//   node web/bench/native.mjs [ROUNDS]
import { execFileSync } from "node:child_process";
import { join } from "node:path";
import { fileURLToPath } from "node:url";

const root = join(fileURLToPath(new URL(".", import.meta.url)), "../..");
const rounds = Number(process.argv[2] ?? 7);
const run = (program, ...words) => execFileSync(program, words, { cwd: root, encoding: "utf8", stdio: ["ignore", "pipe", "pipe"] });

for (const preset of ["bench", "page"]) {
  run("cmake", "--preset", preset);
  run("cmake", "--build", "--preset", preset, "--target", "tav_walk_memory");
}
// What emscripten writes takes a file for an address to fetch from where node has a fetch.
const sides = {
  native: () => run(join(root, "build/bench/bench/tav_walk_memory")),
  wasm: () => run(process.execPath, "--no-experimental-fetch", join(root, "build/page/web/tav_walk_memory.js")),
};
const seconds = {}; // by way, then by side
for (let round = 0; round < rounds; ++round) {
  for (const [side, times] of Object.entries(sides)) {
    for (const [, name, time] of times().matchAll(/^(.+) ([0-9.]+)$/gm)) {
      ((seconds[name] ??= { native: [], wasm: [] })[side]).push(Number(time));
    }
  }
}
const median = (list) => list.sort((a, b) => a - b)[list.length >> 1];
const milliseconds = (time) => `${(time * 1000).toFixed(1)} ms`.padStart(10);
console.log(`${"100 MB".padEnd(32)}${"native".padStart(10)}${"wasm".padStart(10)}  ratio`);
for (const [name, { native, wasm }] of Object.entries(seconds)) {
  const [of, to] = [median(native), median(wasm)];
  console.log(`${name.padEnd(32)}${milliseconds(of)}${milliseconds(to)}   ${(to / of).toFixed(2)}`);
}
