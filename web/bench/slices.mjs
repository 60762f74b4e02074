// What the module reads of a file for each question, between two signs of life, and the memory that it has then:
//   node slices.mjs MODULE.wasm FILE
// Bytes, not times: they are the same on every machine.
import { start } from "./module.mjs";

const [modulePath, file] = process.argv.slice(2);
const questions = {
  tavCheck: [[], [1, 10000]],
  tavFindPath: [["//#65535"], [10000]],
  tavFindText: [["no node has it"], [10000]],
  tavFindBytes: [["00 11 22 33 44 55 66 77"], [10000]],
  tavRecover: [["recovered"], []],
};
const megabytes = (bytes) => `${(bytes / 2 ** 20).toFixed(1)} MB`;
for (const [name, [texts, numbers]] of Object.entries(questions)) {
  const { call, seen, memory } = await start(modulePath);
  call("tavOpen", [file, ""], [0, 0, 0]);
  call("tavCount", [], [0]); // the rows that the page shows at first
  const opened = seen.bytes;
  let [ticks, from, most] = [0, seen.bytes, 0];
  seen.onProgress = () => {
    ticks += 1;
    most = Math.max(most, seen.bytes - from);
    from = seen.bytes;
  };
  const answer = call(name, texts, numbers);
  seen.onProgress();
  const failure = answer.error === undefined ? "" : `, ${answer.error}`;
  console.log(`${name}: ${megabytes(opened)} to open, ${megabytes(seen.bytes - opened)} read, ${ticks} signs, ` +
    `at most ${megabytes(most)} between two, ${megabytes(memory())} of memory${failure}`);
}
