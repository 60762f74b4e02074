// What goes through the whole file: find, check, recover, compare, table; and own names.
import { Engine, Stopped } from "./engine.js";
import { byId, counted, fill, h, hex, save } from "./dom.js";
import { Rows } from "./rows.js";
import { drawPlot } from "./plot.js";
import { goTo, page, reopen, run, say } from "./main.js";

const MOST = 10_000; // places that are listed
const MOST_ROWS = 1_000_000;
let running; // the work that goes on

class Work {
  isStopped = false;

  async begin() {
    this.engine = await Engine.of(page.given, page.choice);
    if (this.isStopped) {
      this.stop();
      throw new Stopped();
    }
    return this.engine;
  }

  stop() {
    this.isStopped = true;
    this.engine?.stop();
  }
}

/** Runs an export in a worker of its own, with a stop button and how far it is. */
async function work(name, { texts = [], numbers = [], onPiece, prepare } = {}) {
  running?.stop();
  const mine = new Work();
  running = mine;
  const bar = byId("progress");
  const begun = performance.now();
  bar.value = 0;
  document.body.classList.add("working");
  try {
    const engine = await mine.begin();
    await prepare?.(engine);
    const answer = await engine.call(name, {
      texts, numbers, onPiece, onProgress: (offset) => { bar.value = offset / Math.max(1, page.given.file.size); },
    });
    return { answer, engine, seconds: (performance.now() - begun) / 1000 };
  } catch (error) {
    mine.stop();
    throw error;
  } finally {
    if (running === mine) {
      document.body.classList.remove("working");
    }
  }
}

const lists = new Map(); // id -> {view, places}

/** A list whose items lead to places. Those in view are elements. */
class Places {
  #items = [];
  #current; // the item that has the keys, once a key has led to one

  constructor(id) {
    this.id = id;
    if (!lists.has(id)) {
      const list = {};
      list.view = new Rows(byId(id), {
        height: 24, count: () => list.places.count, make: (i) => list.places.make(i), drawn: () => list.places.focus(),
      });
      byId(id).addEventListener("keydown", (event) => list.places.key(event));
      lists.set(id, list);
    }
    this.list = lists.get(id);
    this.list.places = this;
    this.list.view.scrollTo(0);
  }

  get count() {
    return this.#items.length;
  }

  /** Where the keys are: an item keeps them when it is made anew. */
  #index() {
    const { activeElement } = document;
    const item = activeElement?.closest?.("[role=listitem]");
    return item && byId(this.id).contains(item) ? Number(item.getAttribute("aria-posinset")) - 1 : this.#current;
  }

  focus() {
    if (this.#current !== undefined) {
      byId(this.id).querySelector(`[aria-posinset="${this.#current + 1}"] button`)?.focus({ preventScroll: true });
    }
  }

  key(event) {
    const last = this.count - 1;
    const { inView } = this.list.view;
    const index = this.#index();
    const next = {
      ArrowDown: (index ?? -1) + 1, ArrowUp: (index ?? 1) - 1, PageDown: (index ?? 0) + inView, PageUp: (index ?? 0) - inView,
      Home: 0, End: last,
    }[event.key];
    if (next !== undefined && last >= 0) {
      event.preventDefault();
      this.#current = Math.max(0, Math.min(last, next));
      this.list.view.show(this.#current);
    }
  }

  add(offset, ...texts) {
    if (this.count < MOST) {
      this.#items.push({ offset, texts: texts.filter((text) => text) });
      this.list.view.later();
    }
  }

  make(index) {
    const { offset, texts } = this.#items[index];
    return h("div", { role: "listitem", "aria-posinset": index + 1, "aria-setsize": this.count },
      h("button", { type: "button", class: "place", "data-offset": offset, title: texts.join("\n"),
        onclick: () => run(() => goTo(offset)) },
      ...texts.map((text, i) => h("span", { class: `part${i}` }, text))));
  }
}

const finds = {
  path: "tavFindPath",
  text: "tavFindText",
  bytes: "tavFindBytes",
};

async function find() {
  const how = byId("findHow").value;
  const what = byId("findWhat").value.trim();
  if (how === "offset") {
    const offset = Number(what);
    if (what === "" || !Number.isSafeInteger(offset) || offset < 0 || offset >= page.given.file.size) {
      throw new Error(`${what} is no offset in this file`);
    }
    await goTo(offset);
    return;
  }
  const places = new Places("found");
  let first = true;
  const { answer, engine } = await work(finds[how], {
    texts: [what], numbers: [MOST], onPiece: (row) => {
      places.add(row.offset, row.path ?? hex(row.offset), row.value ?? row.type ?? counted(row.length, "byte"));
      if (first) {
        first = false;
        run(() => goTo(row.offset));
      }
    },
  });
  engine.stop();
  say(answer.more ? `the first ${counted(answer.found, "place")}` : `${counted(answer.found, "place")} found`);
}

async function check() {
  const places = new Places("findings");
  const { answer, engine, seconds } = await work("tavCheck", {
    numbers: [byId("notes").checked ? 1 : 0, MOST],
    onPiece: (finding) => places.add(finding.offset, hex(finding.offset), finding.path, finding.sentence,
      `${finding.rule}: ${finding.why}`),
  });
  engine.stop();
  const listed = answer.findings > answer.listed ? `, the first ${answer.listed} are listed` : "";
  say(`${counted(answer.nodes, "node")}, ${counted(answer.findings, "finding")}${listed}, ${seconds.toFixed(1)} s`);
}

async function recover() {
  fill(byId("account"));
  const places = new Places("lost");
  const name = `${page.given.name.replace(/\.tav$/i, "")}.recovered.tav`;
  const { answer, engine } = await work("tavRecover", { texts: [name] });
  const blob = await engine.saved(name);
  engine.stop();
  const lines = [
    ["read as", answer.form.text],
    ["bytes", `${answer.bytes} = ${answer.kept} kept + ${answer.lost} lost + ${answer.unread} unread`],
    ["nodes", `${answer.nodes}, ${answer.doubts} of them doubtful`],
    ["groups closed", answer.closed], ["groups made", answer.made], ["pairs made", answer.pairs],
    ["written", counted(answer.written, "byte")],
  ];
  if (answer.other) {
    lines.push(["the form is a guess", `read as ${answer.other.form.text}, ${counted(answer.other.nodes, "node")} would be kept`]);
  }
  fill(byId("account"), ...lines.flatMap(([key, value]) => [h("dt", {}, key), h("dd", {}, value)]));
  answer.lostPlaces.forEach((loss) => places.add(loss.offset, hex(loss.offset), `${counted(loss.length, "byte")} lost`, loss.reason));
  answer.doubtfulNodes.forEach((doubt) => places.add(doubt.offset, hex(doubt.offset), "doubtful", doubt.reason));
  const button = byId("saveRecovered");
  button.hidden = false;
  button.onclick = () => save(blob, name);
  say(`${counted(answer.nodes, "node")} came back`);
}

async function compare() {
  const [file] = byId("other").files;
  if (file === undefined) {
    throw new Error("there is no other file yet");
  }
  const name = file.name === page.given.name ? `the other ${file.name}` : file.name;
  const places = new Places("differences");
  const { answer, engine } = await work("tavDiff", {
    texts: [name], numbers: [MOST], prepare: (worker) => worker.give(name, file),
    onPiece: (difference) => places.add((difference.before ?? difference.after).offset, difference.change,
      (difference.before ?? difference.after).path, difference.sentence),
  });
  engine.stop();
  say(answer.found === 0 ? "no difference" : counted(answer.found, "difference"));
}

const table = { names: [], rows: [], kinds: [] };

function columnsOf(text) {
  return text.split("\n").map((line) => line.trim()).filter((line) => line !== "").map((line) => {
    const named = /^([A-Za-z0-9_]+)=(.*)$/.exec(line);
    return named ? { name: named[1], path: named[2] } : { name: line, path: line };
  });
}

async function makeTable() {
  const columns = columnsOf(byId("columns").value);
  if (columns.length === 0) {
    throw new Error("a table has at least one column");
  }
  Object.assign(table, { names: columns.map(({ name }) => name), rows: [], kinds: [] });
  const { answer, engine } = await work("tavTable", {
    texts: [byId("each").value, columns.map(({ path }, i) => `c${i}=${path}`).join("\n")], numbers: [MOST_ROWS],
    onPiece: ({ kinds, cells }) => {
      cells.forEach((cell) => table.rows.push(cell));
      kinds.forEach((kind, i) => { table.kinds[i] = cells.some((row) => row[i] !== null) || table.kinds[i] === undefined ? kind : table.kinds[i]; });
    },
  });
  engine.stop();
  showTable();
  say(`${counted(answer.rows, "row")}${answer.passedOver > 0 ? `, ${counted(answer.passedOver, "damaged place")} passed over` : ""}`);
}

function showTable() {
  fill(byId("cells"),
    h("thead", {}, h("tr", {}, ...table.names.map((name) => h("th", { scope: "col" }, name)))),
    h("tbody", {}, ...table.rows.slice(0, 1000).map((row) => h("tr", {}, ...row.map((cell) => h("td", {}, cell ?? ""))))));
  const numbers = table.kinds.flatMap((kind, i) => (kind === "number" ? [i] : []));
  const time = table.kinds.indexOf("time");
  byId("saveTable").hidden = table.rows.length === 0;
  byId("plot").toggleAttribute("hidden", numbers.length === 0); // of SVG elements `hidden` is no property
  drawPlot(byId("plot"), table, time, numbers);
}

/** RFC 4180: what holds a comma, a quotation mark or a line end is quoted; an empty text is, a missing value is not. */
function csvOf({ names, rows }) {
  const cell = (text) => text === null ? "" : text === "" || /[",\r\n]/.test(text) ? `"${text.replaceAll('"', '""')}"` : text;
  return [names, ...rows].map((row) => row.map(cell).join(",") + "\n");
}

async function takeNames() {
  const [file] = byId("names").files;
  page.choice.dictionary = file === undefined ? "" : await file.text();
  if (page.given !== undefined) {
    await reopen();
  }
}

function on(id, what) {
  byId(id).addEventListener("click", () => (page.engine ? run(what) : say("open a file first", true)));
}

function choose(tab) {
  for (const other of document.querySelectorAll("[role=tab]")) {
    const isIt = other === tab;
    other.setAttribute("aria-selected", isIt);
    other.tabIndex = isIt ? 0 : -1;
    byId(other.getAttribute("aria-controls")).hidden = !isIt;
  }
}

export function setUpPanels() {
  on("findRun", find);
  on("checkRun", check);
  on("recoverRun", recover);
  on("diffRun", compare);
  on("tableRun", makeTable);
  byId("findForm").addEventListener("submit", (event) => event.preventDefault());
  byId("stop").addEventListener("click", () => {
    running?.stop();
    say("stopped");
  });
  byId("names").addEventListener("change", () => run(async () => {
    try {
      await takeNames();
    } catch (error) {
      page.choice.dictionary = "";
      throw error;
    }
  }));
  byId("saveTable").addEventListener("click", () =>
    save(new Blob(csvOf(table), { type: "text/csv" }), `${page.given.name}.csv`));
  const tabs = [...document.querySelectorAll("[role=tab]")];
  tabs.forEach((tab, i) => {
    tab.addEventListener("click", () => choose(tab));
    tab.addEventListener("keydown", (event) => {
      const step = { ArrowRight: 1, ArrowLeft: -1 }[event.key];
      if (step !== undefined) {
        const next = tabs[(i + step + tabs.length) % tabs.length];
        choose(next);
        next.focus();
      }
    });
  });
  document.addEventListener("opened", () => {
    running?.stop();
    for (const id of ["found", "findings", "lost", "differences"]) {
      new Places(id);
    }
    fill(byId("account"));
    fill(byId("cells"));
    byId("saveRecovered").hidden = true;
    byId("saveTable").hidden = true;
    byId("plot").toggleAttribute("hidden", true);
  });
}
