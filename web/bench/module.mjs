// The module under node, without a page: a host like the worker's, over files of the disk.
import { closeSync, fstatSync, openSync, readFileSync, readSync } from "node:fs";

const decoder = new TextDecoder();

/** Starts the module; `reads` counts its reads and their bytes, `ticks` how often it told progress or found something. */
export async function start(path) {
  const seen = { reads: 0, bytes: 0, ticks: 0, pieces: [] };
  const files = [];
  let exports;
  const at = (place, size) => new Uint8Array(exports.memory.buffer, place, size);
  const host = {
    open(place, size, write) {
      if (write) {
        return files.push({ content: new Uint8Array(), place: 0, size: 0 }) - 1;
      }
      try {
        const descriptor = openSync(decoder.decode(at(place, size)), "r");
        return files.push({ descriptor, place: 0, size: fstatSync(descriptor).size }) - 1;
      } catch {
        return -1;
      }
    },
    close(number) {
      if (files[number].descriptor !== undefined) {
        closeSync(files[number].descriptor);
      }
    },
    read(number, place, size) {
      const file = files[number];
      const to = at(place, size);
      let done;
      if (file.descriptor === undefined) {
        const piece = file.content.subarray(file.place, Math.min(file.size, file.place + size));
        to.set(piece);
        done = piece.length;
      } else {
        done = readSync(file.descriptor, to, 0, size, file.place);
      }
      file.place += done;
      seen.reads += 1;
      seen.bytes += done;
      return done;
    },
    write(number, place, size) {
      const file = files[number];
      const end = file.place + size;
      if (end > file.content.length) {
        const grown = new Uint8Array(Math.max(end, 2 * file.content.length));
        grown.set(file.content);
        file.content = grown;
      }
      file.content.set(at(place, size), file.place);
      file.place = end;
      file.size = Math.max(file.size, end);
      return size;
    },
    seek(number, place) {
      files[number].place = Number(place);
    },
    place: (number) => BigInt(files[number].place),
    size: (number) => BigInt(files[number].size),
    setSize(number, size) {
      files[number].size = Number(size);
      return 0;
    },
    emit(place, size) {
      seen.ticks += 1;
      seen.pieces.push(decoder.decode(at(place, size)));
    },
    progress() {
      seen.ticks += 1;
      seen.onProgress?.();
    },
  };
  const compiled = await WebAssembly.compile(readFileSync(path));
  const imports = { host };
  for (const { module, name } of WebAssembly.Module.imports(compiled)) {
    if (module !== "host") {
      (imports[module] ??= {})[name] = name === "emscripten_notify_memory_growth" ? () => {} : () => 52;
    }
  }
  ({ exports } = await WebAssembly.instantiate(compiled, imports));
  exports._initialize();
  const call = (name, texts = [], numbers = []) => {
    texts.forEach((text, slot) => {
      const bytes = new TextEncoder().encode(text);
      const place = exports.tavText(slot, bytes.length); // first: it may move the memory
      at(place, bytes.length).set(bytes);
    });
    exports[name](...numbers);
    const place = exports.tavAnswer();
    return JSON.parse(decoder.decode(at(place, exports.tavAnswerSize())));
  };
  return { call, seen, memory: () => exports.memory.buffer.byteLength };
}
