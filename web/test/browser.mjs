// A browser with the page, and what the tests do in it.
import { mkdirSync, mkdtempSync, readdirSync, readFileSync, rmSync, watch, writeFileSync } from "node:fs";
import { tmpdir } from "node:os";
import { basename, join } from "node:path";
import { fileURLToPath, pathToFileURL } from "node:url";
import puppeteer from "puppeteer-core";

const PAGE = join(fileURLToPath(new URL(".", import.meta.url)), "../dist/tav.html");
const BROWSER = process.env.TAV_BROWSER ?? "/usr/bin/chromium";

/** Firefox is driven by WebDriver BiDi, which has no tracing, no look into workers, no colours to
 * choose and no closing that tells the page. */
export const isFirefox = basename(BROWSER).startsWith("firefox");
export const onlyInChromium = { skip: isFirefox && "WebDriver BiDi has nothing for it" };

export const folder = mkdtempSync(join(tmpdir(), "tav-page-"));
const downloads = join(folder, "downloads"); // of Firefox, which is told a folder at its start

const PATIENCE = 600_000; // ends what hangs

let browser;

export async function start() {
  mkdirSync(downloads, { recursive: true });
  browser = await puppeteer.launch({
    browser: isFirefox ? "firefox" : "chrome",
    executablePath: BROWSER,
    timeout: PATIENCE,
    protocolTimeout: PATIENCE,
    args: process.getuid() === 0 && !isFirefox ? ["--no-sandbox"] : [],
    extraPrefsFirefox: {
      "browser.download.folderList": 2,
      "browser.download.dir": downloads,
      "browser.download.useDownloadDir": true,
      "browser.helperApps.neverAsk.saveToDisk": "application/octet-stream,text/csv",
    },
  });
}

export async function end() {
  await browser?.close();
  rmSync(folder, { recursive: true, force: true });
}

/** Writes a file for the page. */
export function made(name, bytes) {
  const path = join(folder, name);
  writeFileSync(path, bytes);
  return path;
}

/** The page in a tab of its own, from the disk unless an address is given. `page.requests`: what it asked for. */
export async function visit({ address = pathToFileURL(PAGE).href, ...viewport } = {}) {
  const page = await browser.newPage();
  page.setDefaultTimeout(PATIENCE);
  await page.setViewport({ width: 1200, height: 800, ...viewport });
  page.requests = [];
  page.errors = [];
  page.on("request", (request) => page.requests.push(request.url()));
  page.on("pageerror", (error) => page.errors.push(error.message));
  page.on("console", (message) => message.type() === "error" && page.errors.push(message.text()));
  await page.goto(address);
  return page;
}

/** Waits until what was asked for is done. */
export async function settled(page) {
  await page.waitForFunction(() => document.body.getAttribute("aria-busy") === "false");
}

export async function open(page, path) {
  await (await page.$("#open")).uploadFile(path);
  await settled(page);
}

export async function click(page, selector) {
  await page.$eval(selector, (element) => element.click());
  await settled(page);
}

export async function tab(page, name) {
  await page.$eval(`#tab${name}`, (element) => element.click());
}

export const textOf = (page, selector) => page.$eval(selector, (element) => element.textContent);

/** The rows of the tree that are in view, as {name, type, value}. */
export async function rows(page) {
  await page.waitForFunction(() => document.querySelectorAll("#tree .coming").length === 0);
  return page.$$eval("#tree .row", (all) => all.map((row) => ({
    name: row.querySelector(".name").textContent,
    type: row.querySelector(".type").textContent,
    value: row.querySelector(".value").textContent,
    selected: row.getAttribute("aria-selected") === "true",
  })));
}

/** What the page shows of the selected node. */
export const node = (page) => page.$$eval("#node dt", (names) =>
  Object.fromEntries(names.map((name) => [name.textContent, name.nextElementSibling.textContent])));

export async function find(page, how, what) {
  await tab(page, "Find");
  await page.select("#findHow", how);
  await page.$eval("#findWhat", (input, value) => { input.value = value; }, what);
  await click(page, "#findRun");
}

/**
 * Milliseconds of the processor that the longest task of the page took while something was done. Of the processor, since
 * a busy machine makes any task long by the clock.
 */
export async function longestTask(page, work) {
  const path = join(folder, "trace.json");
  await page.tracing.start({ path, categories: ["toplevel", "devtools.timeline"] });
  await work();
  await page.tracing.stop();
  const { traceEvents } = JSON.parse(readFileSync(path, "utf8"));
  const threadOf = ({ pid, tid }) => `${pid}/${tid}`;
  const pages = new Set(traceEvents.filter(({ name, args }) => name === "thread_name" && args.name === "CrRendererMain").map(threadOf));
  const tasks = traceEvents.filter((event) => event.name === "ThreadControllerImpl::RunTask" && pages.has(threadOf(event)));
  if (tasks.length < 10) {
    throw new Error(`the trace has ${tasks.length} tasks`);
  }
  return Math.max(...tasks.map(({ tdur }) => tdur ?? 0)) / 1000;
}

/** Waits until Firefox has saved a file: until then it is empty, or has a part beside it. */
function savedByFirefox() {
  const isWhole = () => {
    const names = readdirSync(downloads);
    return names.length === 1 && !names[0].endsWith(".part") && readFileSync(join(downloads, names[0])).length > 0;
  };
  return new Promise((resolve, reject) => {
    const patience = setTimeout(() => reject(new Error("nothing was saved")), PATIENCE);
    const look = watch(downloads, () => {
      if (isWhole()) {
        clearTimeout(patience);
        look.close();
        resolve("completed");
      }
    });
  });
}

async function savedByChromium(target) {
  const session = await browser.target().createCDPSession();
  await session.send("Browser.setDownloadBehavior", { behavior: "allow", downloadPath: target, eventsEnabled: true });
  const ended = new Promise((resolve, reject) => {
    const patience = setTimeout(() => reject(new Error("nothing was saved")), PATIENCE);
    session.on("Browser.downloadProgress", ({ state }) => {
      if (state !== "inProgress") {
        clearTimeout(patience);
        resolve(state);
      }
    });
  });
  return { ended: ended.finally(() => session.detach()) };
}

/** The file that a click saves. */
export async function saved(page, selector) {
  rmSync(downloads, { recursive: true });
  mkdirSync(downloads);
  const { ended } = isFirefox ? { ended: savedByFirefox() } : await savedByChromium(downloads);
  await page.$eval(selector, (element) => element.click());
  const state = await ended; // until then it has another name, or not all of its bytes
  const target = mkdtempSync(join(folder, "saved-"));
  const [name] = readdirSync(downloads);
  if (state !== "completed" || name === undefined) {
    throw new Error(`saving: ${state}`);
  }
  const bytes = readFileSync(join(downloads, name));
  writeFileSync(join(target, name), bytes);
  return { name, path: join(target, name), bytes };
}
