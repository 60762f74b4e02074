// The page: one file at a time, its tree, its bytes, and what can be asked of it.
import { Engine, Stopped } from "./engine.js";
import { Tree } from "./tree.js";
import { Bytes } from "./bytes.js";
import { byId, copy, counted, fill, h, hex } from "./dom.js";
import { setUpPanels } from "./panels.js";
import { servedFile } from "./served.js";

export const page = globalThis.tavPage = {
  given: undefined, // {name, file}
  choice: { order: 0, bits: 0, padding: 0, dictionary: "" },
  engine: undefined,
  place: undefined, // of the selected row: {level, row}
  row: undefined,
};

export function say(text, isBad = false) {
  fill(byId("status"), text);
  byId("status").classList.toggle("bad", isBad);
}

let pending = 0;

/** Runs what a user asked for: says what is wrong with it, and that it goes on. */
export async function run(what) {
  ++pending;
  document.body.setAttribute("aria-busy", "true");
  try {
    await what();
  } catch (error) {
    complain(error);
  } finally {
    document.body.setAttribute("aria-busy", String(--pending > 0));
  }
}

function complain(error) {
  if (!(error instanceof Stopped)) {
    say(error.hint ? `${error.message}. ${error.hint}` : error.message, true);
  }
}

const tree = new Tree(byId("tree"), showRow);
const bytes = new Bytes(byId("bytes"), (offset) => run(() => goTo(offset)));

/** Goes to the innermost node around an offset. */
export async function goTo(offset) {
  await tree.reveal(offset);
}

/** Goes to the first node that a path leads to. */
export async function goToPath(path) {
  let found;
  await page.engine.call("tavFindPath", { texts: [path], numbers: [1], onPiece: (row) => { found = row; } });
  if (found === undefined) {
    throw new Error(`${path} leads to no node`);
  }
  await goTo(found.offset);
}

async function open(file, as = file.name) {
  page.given = { name: as, file };
  page.choice = { order: 0, bits: 0, padding: 0, dictionary: page.choice.dictionary };
  for (const name of ["order", "bits", "padding"]) {
    byId(name).value = "0";
  }
  await reopen();
}

/** Opens the file at hand as the choices say. */
export async function reopen() {
  page.engine?.stop();
  page.engine = undefined;
  document.body.classList.remove("opened");
  const engine = await Engine.of(page.given, page.choice);
  page.engine = engine;
  document.body.classList.add("opened");
  document.title = `${page.given.name} · tav`;
  fill(byId("file"), `${page.given.name}, ${counted(page.given.file.size, "byte")}`);
  showForm(engine.opened);
  bytes.open(page.given.file);
  await tree.show(engine);
  document.dispatchEvent(new Event("opened"));
  const wanted = new URLSearchParams(location.hash.slice(1)).get("path");
  if (wanted) {
    await goToPath(wanted);
  }
}

function showForm(opened) {
  const other = opened.otherKind ? `this is ${opened.otherKind}, no stream` : undefined;
  const none = opened.isStream ? other : other ?? "this is no stream, or nothing of it is whole";
  fill(byId("form"), none ?? opened.form.text);
  byId("form").classList.toggle("bad", none !== undefined);
  fill(byId("because"),
    ...opened.because.map((sentence) => h("li", {}, sentence)),
    ...opened.alternatives.map(({ text }) => h("li", { class: "bad" }, `it can be ${text} as well`)));
  say(none ?? "");
}

async function showRow(place, row) {
  page.place = place;
  page.row = row;
  bytes.mark({ from: row.offset, payload: row.offset + (row.header ?? 0), end: row.end ?? row.offset + row.length });
  const told = await page.engine.call("tavNode", { numbers: [place.level, BigInt(place.row)] });
  if (page.place === place) {
    showNode(told);
    bytes.show();
  }
}

function showNode(told) {
  const { row } = told;
  page.path = told.path;
  const facts = [
    ["path", told.path],
    ["type", row.type],
    ["element", row.elm],
    ["value", row.kind === "data" ? (told.whole ? told.value : row.value) : undefined],
    ["unit", row.unit],
    ["meaning", row.meaning],
    ["what it is", row.kindOfValue],
    ["offset", hex(row.offset)],
    ["size", row.end === undefined ? counted(row.length, "byte")
      : `${counted(row.end - row.offset, "byte")}, ${row.header} of them the header${row.open ? "; its size is not known" : ""}`],
    ["info", row.info === undefined ? undefined : hex(row.info)],
    ["form", told.form?.text],
    ["remarks", (row.remarks ?? []).join(", ")],
    ["why", row.reason],
  ];
  fill(byId("node"), ...facts.filter(([, value]) => value !== undefined && value !== "")
    .flatMap(([name, value]) => [h("dt", {}, name), h("dd", {}, value)]));
}

const quoted = (text) => JSON.stringify(text);
const copies = {
  path: () => page.path,
  json: async () => (await page.engine.call("tavJson", { numbers: [page.place.level, BigInt(page.place.row)] })).json,
  cpp: () => `const tav::inspect::Document document(${quoted(page.given.name)});\n` +
    `for (const tav::Node& node : document.find(${quoted(page.path)}))\n{\n}\n`,
  python: () => `import tav\n\nwith tav.open(${quoted(page.given.name)}) as reader:\n` +
    `    for node in reader.findall(${quoted(page.path)}):\n        print(node.value)\n`,
};

function setUp() {
  byId("open").addEventListener("change", (event) => {
    const [file] = event.target.files;
    file && run(() => open(file));
  });
  addEventListener("dragover", (event) => event.preventDefault());
  addEventListener("drop", (event) => {
    event.preventDefault();
    const [file] = event.dataTransfer.files;
    file && run(() => open(file));
  });
  for (const name of ["order", "bits", "padding"]) {
    byId(name).addEventListener("change", (event) => {
      page.choice[name] = Number(event.target.value);
      page.given && run(reopen);
    });
  }
  for (const button of document.querySelectorAll("[data-copy]")) {
    button.addEventListener("click", () => run(async () => {
      if (page.place === undefined) {
        throw new Error("nothing is selected");
      }
      const text = await copies[button.dataset.copy]();
      await copy(text);
      say(`copied ${counted(text.length, "character")}`);
    }));
  }
  addEventListener("hashchange", () => {
    const wanted = new URLSearchParams(location.hash.slice(1)).get("path");
    wanted && page.engine && run(() => goToPath(wanted));
  });
  setUpPanels();
}

setUp();
const served = servedFile();
served && run(async () => open(await served));
