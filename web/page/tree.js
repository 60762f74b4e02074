// The tree: levels of rows, of which those in view are asked for.
import { h, hex, counted } from "./dom.js";
import { Rows } from "./rows.js";

const UNREAD = "not looked at here: too many bytes that are no nodes; checking goes through them";
const PAGE = 64; // rows that are asked for at once

/** The children of one node that is open. */
class Level {
  constructor(number, told) {
    this.number = number;
    this.rows = told.rows;
    this.done = told.done;
    this.open = new Map(); // row -> Level
    this.pages = new Map(); // page -> rows, or the promise of them
  }

  /** Rows that are shown, those of open groups included. */
  total() {
    let all = this.rows;
    for (const below of this.open.values()) {
      all += below.total();
    }
    return all;
  }

  /** Where the row at a place of the shown ones is: {level, row, depth}. */
  at(index, depth = 1) {
    let before = 0; // rows of open groups so far
    for (const [row, below] of [...this.open].sort(([a], [b]) => a - b)) {
      if (index <= row + before) {
        break;
      }
      const inside = below.total();
      if (index <= row + before + inside) {
        return below.at(index - before - row - 1, depth + 1);
      }
      before += inside;
    }
    return { level: this, row: index - before, depth };
  }

  /** The place of a row among the shown ones of this level. */
  placeOf(row) {
    let place = row;
    for (const [open, below] of this.open) {
      place += open < row ? below.total() : 0;
    }
    return place;
  }
}

export class Tree {
  #engine;
  #root;
  #selected = 0;
  #parents = new Map(); // level -> {level, row}

  /** `onSelect(place, row)` is called with what the tree has come to: {level, row, depth} and the row as it was told. */
  constructor(element, onSelect) {
    this.element = element;
    this.onSelect = onSelect;
    this.view = new Rows(element, { height: 24, count: () => this.#root?.total() ?? 0, make: (i) => this.#make(i) });
    element.addEventListener("keydown", (event) => this.#key(event));
  }

  async show(engine) {
    this.#engine = engine;
    this.#parents.clear();
    this.#selected = 0;
    this.#root = undefined;
    const told = await engine.call("tavCount", { numbers: [0] });
    this.#root = new Level(0, told.level);
    this.view.scrollTo(0);
    this.#countOn(this.#root, engine);
    if (this.#root.rows > 0) {
      const first = await this.#wait(this.#root, 0);
      if (first?.kind === "group") {
        await this.open(0);
      }
      await this.select(0);
    }
  }

  get rows() {
    return this.#root?.total() ?? 0;
  }

  get selected() {
    return this.#selected;
  }

  /** Counts the rows of a level on, a few hundred at a time, so that the worker hears what else is asked. */
  async #countOn(level, engine) {
    let drawn = performance.now();
    while (!level.done && this.#engine === engine) {
      const { level: told } = await engine.call("tavCount", { numbers: [level.number] });
      level.rows = told.rows;
      level.done = told.done;
      level.pages.delete(Math.floor((level.rows - 1) / PAGE));
      if (level.done || performance.now() - drawn > 200) {
        drawn = performance.now();
        this.view.later();
      }
    }
  }

  /** A row's data; undefined, and drawn again later, while it is on its way. */
  #rowOf(level, row) {
    const page = Math.floor(row / PAGE);
    const there = level.pages.get(page);
    if (there === undefined || (Array.isArray(there) && there.length <= row % PAGE)) {
      this.#fetch(level, page).then(() => this.view.later(), () => {});
      return undefined;
    }
    return Array.isArray(there) ? there[row % PAGE] : undefined;
  }

  #fetch(level, page) {
    const there = level.pages.get(page);
    if (there instanceof Promise) {
      return there;
    }
    const asked = this.#engine.call("tavRows", { numbers: [level.number, BigInt(page * PAGE), PAGE] }).then(({ rows }) => {
      level.pages.set(page, rows);
      return rows;
    });
    level.pages.set(page, asked);
    if (level.pages.size > 200) {
      level.pages.delete(level.pages.keys().next().value);
    }
    return asked;
  }

  async #wait(level, row) {
    const there = this.#rowOf(level, row);
    return there ?? (await this.#fetch(level, Math.floor(row / PAGE)))[row % PAGE];
  }

  #make(index) {
    const { level, row, depth } = this.#root.at(index);
    const data = this.#rowOf(level, row);
    const isSelected = index === this.#selected;
    const isOpen = level.open.has(row);
    const isGroup = data?.kind === "group";
    const element = h("div", {
      class: `row ${data?.kind ?? "coming"}${data?.remarks?.length ? " remarkable" : ""}`,
      id: `row-${index}`,
      role: "treeitem",
      "aria-level": depth,
      "aria-posinset": row + 1,
      "aria-setsize": level.done ? level.rows : -1,
      "aria-selected": isSelected,
      "aria-expanded": isGroup ? isOpen : undefined,
      onclick: () => this.select(index).then(() => this.element.focus()),
      ondblclick: () => this.toggle(index),
    });
    element.style.paddingInlineStart = `${Math.min(depth - 1, 30) * 16 + 4}px`;
    if (data === undefined) {
      element.append("…");
      return element;
    }
    element.append(
      h("span", { class: "twist", "aria-hidden": "true", onclick: (event) => { event.stopPropagation(); this.toggle(index); } },
        isGroup ? (isOpen ? "▾" : "▸") : ""),
      h("span", { class: "name" }, data.step ?? `${data.kind}: ${counted(data.length, "byte")}`),
      h("span", { class: "type" }, data.type ?? ""),
      h("span", { class: "value" }, data.value ?? (data.kind === "unread" ? UNREAD : data.reason ?? ""), data.unit && data.unit !== "1" ? ` ${data.unit}` : ""),
      h("span", { class: "remark" }, (data.remarks ?? []).join(", ")),
      h("span", { class: "offset" }, hex(data.offset)),
    );
    return element;
  }

  async select(index) {
    if (index < 0 || index >= this.rows) {
      return;
    }
    this.#selected = index;
    this.element.setAttribute("aria-activedescendant", `row-${index}`);
    this.view.show(index);
    const place = this.#root.at(index);
    const data = await this.#wait(place.level, place.row);
    if (this.#selected === index && data !== undefined) {
      this.view.draw();
      await this.onSelect({ level: place.level.number, row: place.row }, data);
    }
  }

  async open(index) {
    const { level, row } = this.#root.at(index);
    const data = await this.#wait(level, row);
    if (data?.kind !== "group" || level.open.has(row)) {
      return level.open.get(row);
    }
    const told = await this.#engine.call("tavExpand", { numbers: [level.number, BigInt(row)] });
    const below = new Level(told.level.level, told.level);
    level.open.set(row, below);
    this.#parents.set(below, { level, row });
    this.view.draw();
    this.#countOn(below, this.#engine);
    return below;
  }

  async toggle(index) {
    const { level, row } = this.#root.at(index);
    if (level.open.delete(row)) {
      this.view.draw();
      return;
    }
    await this.open(index);
  }

  #indexOf(level, row) {
    let index = level.placeOf(row);
    for (let at = this.#parents.get(level); at !== undefined; at = this.#parents.get(at.level)) {
      index += at.level.placeOf(at.row) + 1;
    }
    return index;
  }

  /** Goes to the innermost node around an offset. */
  async reveal(offset) {
    const { rows } = await this.#engine.call("tavReveal", { numbers: [BigInt(offset)] });
    let level = this.#root;
    for (const [depth, row] of rows.entries()) {
      while (row >= level.rows && !level.done) {
        const { level: told } = await this.#engine.call("tavCount", { numbers: [level.number] });
        level.rows = told.rows;
        level.done = told.done;
      }
      const index = this.#indexOf(level, row);
      if (depth + 1 === rows.length) {
        await this.select(index);
        return;
      }
      level = level.open.get(row) ?? (await this.open(index));
    }
  }

  #key(event) {
    const { level, row } = this.rows > 0 ? this.#root.at(this.#selected) : {};
    const steps = {
      ArrowDown: 1, ArrowUp: -1, PageDown: this.view.inView, PageUp: -this.view.inView,
      Home: -Infinity, End: Infinity,
    };
    if (event.key in steps) {
      this.select(Math.max(0, Math.min(this.rows - 1, this.#selected + steps[event.key])));
    } else if (event.key === "ArrowRight") {
      level?.open.has(row) ? this.select(this.#selected + 1) : this.open(this.#selected);
    } else if (event.key === "ArrowLeft") {
      const parent = this.#parents.get(level);
      if (level?.open.has(row)) {
        this.toggle(this.#selected);
      } else if (parent !== undefined) {
        this.select(this.#indexOf(parent.level, parent.row));
      }
    } else if (event.key === "Enter" || event.key === " ") {
      this.toggle(this.#selected);
    } else {
      return;
    }
    event.preventDefault();
  }
}
