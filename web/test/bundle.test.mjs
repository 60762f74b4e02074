// Making the page: the same bytes wherever its sources lie.
import assert from "node:assert/strict";
import { execFileSync } from "node:child_process";
import { cpSync, mkdirSync, mkdtempSync, readFileSync, rmSync, symlinkSync, writeFileSync } from "node:fs";
import { tmpdir } from "node:os";
import { join } from "node:path";
import { test } from "node:test";
import { fileURLToPath } from "node:url";

const web = join(fileURLToPath(new URL(".", import.meta.url)), "..");

test("a folder with blanks and signs in its name makes the same page", () => {
  const work = mkdtempSync(join(tmpdir(), "tav-bundle-"));
  try {
    const module = join(work, "module.wasm");
    writeFileSync(module, "any bytes");
    const there = join(work, "another folder, 100%20 so/web");
    mkdirSync(there, { recursive: true });
    for (const name of ["bundle.mjs", "page", "package.json"]) {
      cpSync(join(web, name), join(there, name), { recursive: true });
    }
    cpSync(join(web, "../LICENSE"), join(there, "../LICENSE"));
    symlinkSync(join(web, "node_modules"), join(there, "node_modules"));
    const made = [web, there].map((folder, i) => {
      const out = join(work, `page${i}.html`);
      execFileSync(process.execPath, [join(folder, "bundle.mjs"), module, out], { stdio: "pipe" });
      return readFileSync(out);
    });
    assert.ok(made[0].length > 10000);
    assert.ok(made[0].equals(made[1]));
  } finally {
    rmSync(work, { recursive: true, force: true });
  }
});
