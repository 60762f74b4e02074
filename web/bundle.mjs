// Makes the page: one HTML file of the sources in page/ and the module.
//   node bundle.mjs MODULE.wasm OUT.html
import { createHash } from "node:crypto";
import { mkdirSync, readFileSync, writeFileSync } from "node:fs";
import { dirname, join } from "node:path";
import { fileURLToPath } from "node:url";
import { gzipSync } from "node:zlib";
import { buildSync, transformSync } from "esbuild";

// Bytes of the page, as a file, and of the module packed by gzip -9 that nobody goes beyond without knowing.
const MOST_PAGE = 247_000;
const MOST_MODULE = 153_600;

const here = dirname(fileURLToPath(import.meta.url));
const [modulePath, out] = process.argv.slice(2);
const source = (name) => readFileSync(join(here, "page", name), "utf8");

function bundled(name) {
  const { outputFiles } = buildSync({
    entryPoints: [join(here, "page", name)], bundle: true, write: false, minify: true, format: "iife",
    target: ["chrome103", "firefox113", "safari16.4"], charset: "utf8", legalComments: "none",
  });
  return outputFiles[0].text.trimEnd().replaceAll("</script", "<\\/script");
}

const hashOf = (text) => `'sha256-${createHash("sha256").update(text).digest("base64")}'`;
const script = bundled("main.js");
const style = transformSync(source("style.css"), { loader: "css", minify: true }).code.trimEnd();
const packed = gzipSync(readFileSync(modulePath), { level: 9 });
const policy = [
  "default-src 'none'",
  "connect-src 'none'", // `tav view` puts the one address in its place
  `script-src ${hashOf(script)} 'wasm-unsafe-eval'`,
  `style-src ${hashOf(style)}`,
  "worker-src blob:",
  "img-src data:",
  "base-uri 'none'",
  "form-action 'none'",
].join("; ");
const escaped = (text) => text.replaceAll("&", "&amp;").replaceAll("<", "&lt;");
const licences = [readFileSync(join(here, "../LICENSE"), "utf8"), source("licences.txt")].join("\n");
const parts = {
  LICENCES: escaped(licences),
  POLICY: policy, STYLE: style, SCRIPT: script, WORKER: bundled("worker.js"), MODULE: packed.toString("base64") };
const page = source("index.html").replace(/%([A-Z]+)%/g, (_, name) => parts[name]);

mkdirSync(dirname(out), { recursive: true });
writeFileSync(out, page);
const kilobytes = (bytes) => `${Math.ceil(bytes / 1024)} KB`;
console.log(`${out}: ${kilobytes(Buffer.byteLength(page))}, its module ${kilobytes(packed.length)}`);
const rest = Buffer.byteLength(page) - parts.MODULE.length;
console.log(`the page without its module: ${kilobytes(rest)}`);
if (Buffer.byteLength(page) > MOST_PAGE || packed.length > MOST_MODULE) {
  console.error(`too large: the page may have ${MOST_PAGE} bytes, and its packed module ${MOST_MODULE}`);
  process.exit(1);
}
