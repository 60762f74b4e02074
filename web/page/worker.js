// The worker around the module: it has the files that the page was given, reads slices of them when the module asks,
// and keeps the files that the module makes. A message is a call: {id, name, ...}; answers carry its id.
const CHUNK = 1 << 20;
const MOST_PIECES = 100;
const decoder = new TextDecoder();
const encoder = new TextEncoder();

let module; // the module's exports
let memory;
let current = 0; // the call that is answered
let toldAt = 0;
let pieces = []; // of the answer, not sent yet
const given = new Map(); // name -> File
const made = new Map(); // name -> MadeFile
const open = [];

/** A file in memory, in pieces, so that it grows without being copied. */
class MadeFile {
  chunks = [];
  size = 0;

  read(place, to) {
    const end = Math.min(place + to.length, this.size);
    let done = 0;
    while (place + done < end) {
      const at = place + done;
      const chunk = this.chunks[Math.floor(at / CHUNK)];
      const from = at % CHUNK;
      const count = Math.min(CHUNK - from, end - at);
      to.set(chunk.subarray(from, from + count), done);
      done += count;
    }
    return done;
  }

  write(place, bytes) {
    this.grow(place + bytes.length);
    for (let done = 0; done < bytes.length;) {
      const at = place + done;
      const from = at % CHUNK;
      const count = Math.min(CHUNK - from, bytes.length - done);
      this.chunks[Math.floor(at / CHUNK)].set(bytes.subarray(done, done + count), from);
      done += count;
    }
    return bytes.length;
  }

  grow(size) {
    while (this.chunks.length * CHUNK < size) {
      this.chunks.push(new Uint8Array(CHUNK));
    }
    this.size = Math.max(this.size, size);
  }

  blob() {
    const last = this.size % CHUNK;
    const whole = this.chunks.slice(0, Math.ceil(this.size / CHUNK));
    if (last !== 0) {
      whole.push(whole.pop().subarray(0, last));
    }
    return new Blob(whole, { type: "application/octet-stream" });
  }
}

/** A file of the user: synchronous reads of slices are what workers have FileReaderSync for. */
class GivenFile {
  constructor(file) {
    this.file = file;
    this.size = file.size;
    this.reader = new FileReaderSync();
  }

  read(place, to) {
    const slice = this.file.slice(place, place + to.length);
    const bytes = new Uint8Array(this.reader.readAsArrayBuffer(slice));
    to.set(bytes);
    return bytes.length;
  }
}

/** A file that `tav view` hands out, in pieces: a request costs more than the bytes do. */
class ServedFile {
  piece = new Uint8Array();
  from = 0;

  constructor({ address, size, tag }) {
    this.size = size;
    this.address = address;
    this.tag = tag;
  }

  read(place, to) {
    const count = Math.min(to.length, this.size - place);
    if (count <= 0) {
      return 0;
    }
    if (place < this.from || place + count > this.from + this.piece.length) {
      const last = Math.min(this.size, place + Math.max(count, CHUNK / 4)) - 1;
      const request = new XMLHttpRequest();
      request.open("GET", this.address, false);
      request.responseType = "arraybuffer";
      request.setRequestHeader("Range", `bytes=${place}-${last}`);
      request.setRequestHeader("If-Match", this.tag);
      request.send();
      if (request.status !== 206) {
        return -1;
      }
      this.piece = new Uint8Array(request.response);
      this.from = place;
    }
    to.set(this.piece.subarray(place - this.from, place - this.from + count));
    return count;
  }
}

const readable = (file) => file instanceof Blob ? new GivenFile(file) : new ServedFile(file);

const bytesAt = (at, size) => new Uint8Array(memory.buffer, at, size);
const textAt = (at, size) => decoder.decode(bytesAt(at, size));

const host = {
  open(at, size, write, create) {
    const name = textAt(at, size);
    if (write && create) {
      const file = new MadeFile();
      if (name !== "") {
        made.set(name, file);
      }
      return open.push({ file, place: 0 }) - 1;
    }
    const file = given.get(name);
    if (file === undefined) {
      return -1;
    }
    return write ? -2 : open.push({ file: readable(file), place: 0 }) - 1;
  },
  close(number) {
    open[number] = undefined;
  },
  read(number, at, size) {
    try {
      const stands = open[number];
      const done = stands.file.read(stands.place, bytesAt(at, size));
      stands.place += done;
      return done;
    } catch {
      return -1; // it was removed, or changed since the page was given it
    }
  },
  write(number, at, size) {
    const stands = open[number];
    stands.place += stands.file.write(stands.place, bytesAt(at, size));
    return size;
  },
  seek(number, place) {
    open[number].place = Number(place);
  },
  place: (number) => BigInt(open[number].place),
  size: (number) => BigInt(open[number].file.size),
  setSize(number, size) {
    const { file } = open[number];
    if (!(file instanceof MadeFile)) {
      return -1;
    }
    file.grow(Number(size));
    file.size = Number(size);
    return 0;
  },
  emit(at, size) {
    pieces.push(JSON.parse(textAt(at, size)));
    if (pieces.length === MOST_PIECES || performance.now() - toldAt > 50) {
      handOver();
    }
  },
  progress(offset) {
    const now = performance.now();
    if (now - toldAt > 50) {
      handOver();
      postMessage({ id: current, progress: Number(offset) });
    }
  },
};

/** Sends what was emitted: each message costs the page a task. */
function handOver() {
  toldAt = performance.now();
  if (pieces.length > 0) {
    postMessage({ id: current, pieces });
    pieces = [];
  }
}

/** What the C library under the module asks of a system: there is none. */
function systemOf(compiled) {
  const imports = { host };
  for (const { module: from, name } of WebAssembly.Module.imports(compiled)) {
    if (from !== "host") {
      imports[from] ??= {};
      imports[from][name] = own[name] ?? (() => 52); // ENOSYS
    }
  }
  return imports;
}

const own = {
  emscripten_notify_memory_growth() {},
  proc_exit(status) {
    throw new Error(`the module has ended with ${status}`);
  },
  clock_time_get(_clock, _precision, at) {
    new DataView(memory.buffer).setBigUint64(at, BigInt(Math.round(performance.now() * 1e6)), true);
    return 0;
  },
};

function put(slot, text) {
  const bytes = encoder.encode(text);
  bytesAt(module.tavText(slot, bytes.length), bytes.length).set(bytes);
}

/** Calls an export with texts and numbers, and returns its answer. */
function call(name, texts, numbers) {
  texts.forEach((text, slot) => put(slot, text));
  pieces = [];
  module[name](...numbers);
  handOver();
  return JSON.parse(textAt(module.tavAnswer(), module.tavAnswerSize()));
}

async function run(message) {
  switch (message.name) {
    case "start": {
      const instance = await WebAssembly.instantiate(message.module, systemOf(message.module));
      module = instance.exports;
      memory = module.memory;
      module._initialize();
      return {};
    }
    case "give":
      given.set(message.as, message.file);
      return {};
    case "saved":
      return { blob: made.get(message.as).blob() };
    case "memory":
      return { bytes: memory.buffer.byteLength };
    default:
      return call(message.name, message.texts ?? [], message.numbers ?? []);
  }
}

// One call after another: `start` is the only one that has to wait for something.
let before = Promise.resolve();
onmessage = ({ data }) => {
  before = before.then(async () => {
    current = data.id;
    try {
      postMessage({ id: data.id, answer: await run(data) });
    } catch (error) {
      postMessage({ id: data.id, answer: { error: String(error?.message ?? error) } });
    }
  });
};
