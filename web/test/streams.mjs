// Streams for the tests, made by hand: little-endian, 64-bit headers, nothing padded. The golden files are the others.
import { readFileSync, readdirSync } from "node:fs";
import { join } from "node:path";
import { fileURLToPath } from "node:url";

const GOLDEN = join(fileURLToPath(new URL(".", import.meta.url)), "../../tests/golden");

export const SYSTEM = 60100;
export const HOST = 60102;
export const HOST_NAME = 60103;
export const CPU_ONLINE = 60111;
const GROUP = 2;
const TEXT = 102;
const NUMBER = 55;
const TIME = 100;

function node(type, elm, payload) {
  const header = Buffer.alloc(16);
  header.writeBigUInt64LE(BigInt(payload.length));
  header.writeUInt16LE(type, 12);
  header.writeUInt16LE(elm, 14);
  return Buffer.concat([header, payload]);
}

export const group = (elm, ...children) => node(GROUP, elm, Buffer.concat(children));

export function number(elm, value) {
  const payload = Buffer.alloc(4);
  payload.writeUInt32LE(value);
  return node(NUMBER, elm, payload);
}

/** UTF-8, which the two bytes of the code page say. */
export const text = (elm, value) => node(TEXT, elm, Buffer.concat([Buffer.from([0xb8, 0x04]), Buffer.from(value)]));

export function time(elm, seconds) {
  const payload = Buffer.alloc(16);
  payload.writeBigUInt64LE(BigInt(seconds));
  return node(TIME, elm, payload);
}

export function golden(name) {
  const lines = readFileSync(join(GOLDEN, `${name}.hex`), "utf8").replace(/#.*$/gm, "");
  return Buffer.from(lines.replace(/\s+/g, ""), "hex");
}

export const goldenNames = () =>
  readdirSync(GOLDEN).filter((name) => name.endsWith(".hex")).map((name) => name.slice(0, -4)).sort();

/** A root of many alike. */
export function many(count) {
  const one = number(CPU_ONLINE, 0);
  const all = Buffer.alloc(16 + count * one.length);
  all.writeBigUInt64LE(BigInt(count * one.length));
  all.writeUInt16LE(GROUP, 12);
  all.writeUInt16LE(SYSTEM, 14);
  for (let i = 0; i < count; ++i) {
    one.copy(all, 16 + i * one.length);
    all.writeUInt32LE(i, 32 + i * one.length);
  }
  return all;
}

export const hosts = (...names) => group(SYSTEM, ...names.map((name, i) =>
  group(HOST, text(HOST_NAME, name), number(CPU_ONLINE, 8 + i))));
