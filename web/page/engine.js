// Workers with the module, and calls to them. A file's tree has one; each long piece of work has its own, so that the
// tree answers meanwhile and stopping is ending the worker.
let compiled;

/** The module, unpacked and compiled once. */
async function compiledModule() {
  if (compiled === undefined) {
    const packed = Uint8Array.from(atob(document.getElementById("module").textContent), (c) => c.charCodeAt(0));
    const stream = new Blob([packed]).stream().pipeThrough(new DecompressionStream("gzip"));
    compiled = WebAssembly.compile(await new Response(stream).arrayBuffer());
  }
  return compiled;
}

export class Stopped extends Error {}

export class Engine {
  #worker;
  #calls = new Map();
  #next = 1;

  /** A worker that has a file, and has opened it as `choice` says: see `opened`. */
  static async of(given, choice) {
    const engine = new Engine();
    await engine.#begin();
    await engine.give(given.name, given.file);
    engine.given = given;
    engine.opened = await engine.call("tavOpen", {
      texts: [given.name, choice.dictionary ?? ""],
      numbers: [choice.order ?? 0, choice.bits ?? 0, choice.padding ?? 0],
    });
    return engine;
  }

  async #begin() {
    const source = document.getElementById("worker").textContent;
    const address = URL.createObjectURL(new Blob([source], { type: "text/javascript" }));
    this.#worker = new Worker(address);
    URL.revokeObjectURL(address);
    this.#worker.onmessage = ({ data }) => this.#take(data);
    this.#worker.onerror = (event) => this.stop(new Error(event.message || "the worker has ended"));
    await this.#send({ name: "start", module: await compiledModule() });
  }

  #take(data) {
    const waiting = this.#calls.get(data.id);
    if (data.pieces !== undefined) {
      data.pieces.forEach((piece) => waiting?.onPiece?.(piece));
    } else if (data.progress !== undefined) {
      waiting?.onProgress?.(data.progress);
    } else {
      this.#calls.delete(data.id);
      data.answer.error === undefined ? waiting?.resolve(data.answer) : waiting?.reject(failure(data.answer));
    }
  }

  #send(message, { onPiece, onProgress } = {}) {
    if (this.#worker === undefined) {
      return Promise.reject(new Stopped());
    }
    const id = this.#next++;
    return new Promise((resolve, reject) => {
      this.#calls.set(id, { resolve, reject, onPiece, onProgress });
      this.#worker.postMessage({ ...message, id });
    });
  }

  /** An export of the module. `numbers` that are 64 bits wide there are bigints. */
  call(name, { texts = [], numbers = [], ...told } = {}) {
    return this.#send({ name, texts, numbers }, told);
  }

  give(name, file) {
    return this.#send({ name: "give", as: name, file });
  }

  async saved(name) {
    return (await this.#send({ name: "saved", as: name })).blob;
  }

  async memory() {
    return (await this.#send({ name: "memory" })).bytes;
  }

  stop(why = new Stopped()) {
    this.#worker?.terminate();
    this.#worker = undefined;
    for (const { reject } of this.#calls.values()) {
      reject(why);
    }
    this.#calls.clear();
  }
}

function failure(answer) {
  const error = new Error(answer.error);
  error.hint = answer.hint ?? "";
  error.offset = answer.offset;
  return error;
}
