// Rows of which only those in view are elements.
const MOST_PIXELS = 8_000_000; // browsers lay out no more than some ten million

/**
 * A list in `element`, which scrolls. `count()` says how many rows there are, `make(index)` makes the element of one,
 * `drawn()` is called when those in view are there anew.
 * Where all rows are higher than a browser lays out, scrolling goes by shares of the whole.
 */
export class Rows {
  #spacer = document.createElement("div");
  #view = document.createElement("div");

  constructor(element, { height, count, make, drawn }) {
    this.element = element;
    this.height = height;
    this.count = count;
    this.make = make;
    this.drawn = drawn;
    this.#spacer.className = "spacer";
    this.#view.className = "view";
    this.#spacer.setAttribute("role", "presentation");
    this.#view.setAttribute("role", "presentation");
    this.#spacer.append(this.#view);
    element.replaceChildren(this.#spacer);
    element.addEventListener("scroll", () => this.later(), { passive: true });
    new ResizeObserver(() => this.later()).observe(element);
  }

  get inView() {
    return Math.max(1, Math.floor(this.element.clientHeight / this.height));
  }

  #pixels() {
    return Math.min(MOST_PIXELS, this.count() * this.height);
  }

  /** The first row in view, with a fraction. */
  first() {
    const all = this.count();
    const room = this.#pixels() - this.element.clientHeight;
    if (all * this.height <= MOST_PIXELS || room <= 0) {
      return this.element.scrollTop / this.height;
    }
    return (this.element.scrollTop / room) * (all - this.inView);
  }

  scrollTo(row) {
    const all = this.count();
    this.#spacer.style.height = `${this.#pixels()}px`;
    if (all * this.height <= MOST_PIXELS) {
      this.element.scrollTop = row * this.height;
    } else {
      this.element.scrollTop = (row / (all - this.inView)) * (this.#pixels() - this.element.clientHeight);
    }
    this.draw();
  }

  /** Scrolls as little as shows the row. */
  show(row) {
    const first = this.first();
    if (row < first) {
      this.scrollTo(row);
    } else if (row + 1 > first + this.inView) {
      this.scrollTo(row + 1 - this.inView);
    } else {
      this.draw();
    }
  }

  later() {
    this.pending ??= requestAnimationFrame(() => {
      this.pending = undefined;
      this.draw();
    });
  }

  draw() {
    const all = this.count();
    this.#spacer.style.height = `${this.#pixels()}px`;
    const first = Math.max(0, Math.min(Math.floor(this.first()), all - 1));
    const last = Math.min(all, first + this.inView + 2);
    const made = [];
    for (let row = first; row < last; ++row) {
      made.push(this.make(row));
    }
    const isShort = all * this.height <= MOST_PIXELS;
    const top = isShort ? first * this.height : Math.min(this.element.scrollTop, this.#pixels() - made.length * this.height);
    this.#view.style.transform = `translateY(${Math.max(0, top)}px)`;
    this.#view.replaceChildren(...made);
    this.drawn?.();
  }
}
