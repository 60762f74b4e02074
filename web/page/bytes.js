// The bytes of the file, sixteen a row, read as they come into view.
import { h } from "./dom.js";
import { Rows } from "./rows.js";

const WIDE = 16;
const PIECE = 4096;

export class Bytes {
  #file;
  #pieces = new Map(); // number -> Uint8Array, or null while it is read
  #marked = { from: 0, payload: 0, end: 0 };
  #cursor = 0;

  /** `onByte(offset)`: a byte was chosen. */
  constructor(element, onByte) {
    this.element = element;
    this.onByte = onByte;
    this.view = new Rows(element, {
      height: 20, count: () => Math.ceil((this.#file?.size ?? 0) / WIDE), make: (row) => this.#make(row),
    });
    element.addEventListener("keydown", (event) => this.#key(event));
  }

  open(file) {
    this.#file = file;
    this.#pieces.clear();
    this.#cursor = 0;
    this.mark({ from: 0, payload: 0, end: 0 });
  }

  /** Shows where a node lies: its header, and what is behind that. */
  mark(marked) {
    this.#marked = marked;
    this.#cursor = marked.from;
    this.show();
  }

  /** Scrolls to where it stands; again when there is more or less room. */
  show() {
    this.element.setAttribute("aria-activedescendant", `byte-${this.#cursor}`); // what screen readers say
    this.view.show(Math.floor(this.#cursor / WIDE));
  }

  #byte(offset) {
    const number = Math.floor(offset / PIECE);
    const piece = this.#pieces.get(number);
    if (piece === undefined) {
      this.#pieces.set(number, null);
      const file = this.#file;
      file.slice(number * PIECE, (number + 1) * PIECE).arrayBuffer().then((bytes) => {
        if (this.#file === file) {
          this.#pieces.set(number, new Uint8Array(bytes));
          this.view.later();
        }
      }, () => {});
      if (this.#pieces.size > 500) {
        this.#pieces.delete(this.#pieces.keys().next().value);
      }
    }
    return piece?.[offset % PIECE];
  }

  #make(row) {
    const from = row * WIDE;
    const element = h("div", { class: "line", role: "row", "aria-rowindex": row + 1 },
      h("span", { class: "offset", role: "rowheader" }, from.toString(16).padStart(8, "0")));
    let text = "";
    for (let offset = from; offset < Math.min(from + WIDE, this.#file.size); ++offset) {
      const value = this.#byte(offset);
      const { from: start, payload, end } = this.#marked;
      const part = offset < start || offset >= end ? "" : offset < payload ? " header" : " payload";
      element.append(h("span", {
        class: `byte${part}`, role: "gridcell", id: `byte-${offset}`, "data-offset": offset,
        "aria-selected": offset === this.#cursor, onclick: () => this.#choose(offset),
      }, value === undefined ? "··" : value.toString(16).padStart(2, "0")));
      text += value >= 0x20 && value < 0x7f ? String.fromCharCode(value) : "·";
    }
    element.append(h("span", { class: "chars", "aria-hidden": "true" }, text));
    return element;
  }

  #choose(offset) {
    this.#cursor = offset;
    this.show();
    this.onByte(offset);
  }

  #key(event) {
    const steps = {
      ArrowRight: 1, ArrowLeft: -1, ArrowDown: WIDE, ArrowUp: -WIDE,
      PageDown: WIDE * this.view.inView, PageUp: -WIDE * this.view.inView,
    };
    if (event.key in steps) {
      const last = Math.max(0, (this.#file?.size ?? 0) - 1);
      this.#cursor = Math.max(0, Math.min(last, this.#cursor + steps[event.key]));
      this.show();
    } else if (event.key === "Enter") {
      this.#choose(this.#cursor);
    } else {
      return;
    }
    event.preventDefault();
  }
}
