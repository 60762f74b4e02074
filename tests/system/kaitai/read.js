// Reads streams by docs/tav.ksy: compiles the description and writes, for each request, the nodes as JSON.
//   node read.js DESCRIPTION <REQUESTS          a request is a line of JSON: file, big, wide, aligned, uncounted
"use strict";
const fs = require("fs");
const path = require("path");
const vm = require("vm");
const yaml = require("js-yaml");
const compiler = require("kaitai-struct-compiler");
const { KaitaiStream } = require("kaitai-struct");

// The compiled text asks for the runtime as any module does.
function load(files) {
  const [name] = Object.keys(files);
  const compiled = { exports: {} };
  const wrapped = vm.runInThisContext(`(function (exports, require, module, define) {${files[name]}\n})`, name);
  wrapped(compiled.exports, require, compiled, undefined);
  return compiled.exports.Tav || compiled.exports;
}

const hex = (bytes) => Buffer.from(bytes).toString("hex");

function payloadOf(node) {
  const payload = node.payload;
  if (payload instanceof Uint8Array) {
    return { raw: hex(payload) };
  }
  const stream = payload._io;
  stream.seek(0);
  const raw = hex(stream.readBytesFull());
  if (payload.seconds !== undefined) {
    return { raw, date: [payload.seconds, payload.fractionA, payload.fractionB, payload.further, payload.offsetMinutes] };
  }
  return { raw, value: payload.value, codePage: payload.codePage };
}

function nodeOf(node) {
  const made = { id: node.element, type: node.typeCode, header: node.isWide ? 64 : 32, size: node.size, info: node.flags };
  if (node.isGroup) {
    const group = node.isOpen ? node.openChildren : node.children;
    made.children = (group.nodes || []).map(nodeOf);
  } else {
    Object.assign(made, payloadOf(node));
  }
  if (node.extra !== undefined) {
    made.extra = hex(node.extra);
  }
  return made;
}

async function main() {
  const description = yaml.load(fs.readFileSync(process.argv[2], "utf8"));
  const Tav = load(await compiler.compile("javascript", description, null, false));
  for (const line of fs.readFileSync(0, "utf8").split("\n").filter(Boolean)) {
    const asked = JSON.parse(line);
    const stream = new KaitaiStream(fs.readFileSync(path.resolve(asked.file)));
    const tav = new Tav(stream, null, null, asked.big, asked.wide, asked.aligned, asked.uncounted);
    if (typeof tav._read === "function" && tav.roots === undefined) {
      tav._read();
    }
    console.log(JSON.stringify(tav.roots.map(nodeOf)));
  }
}

main().catch((error) => {
  console.error(error);
  process.exit(1);
});
