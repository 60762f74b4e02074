// The file that `tav view` hands out with the page. It is read as a file that a user has chosen is.
const failed = () => new Error("the file has changed or is gone, or tav view has ended");

class ServedFile {
  constructor(name, address, size, tag) {
    this.name = name;
    this.address = address;
    this.size = size;
    this.tag = tag;
  }

  slice(from, to) {
    const headers = { "Range": `bytes=${from}-${Math.min(to, this.size) - 1}`, "If-Match": this.tag };
    return {
      arrayBuffer: async () => {
        const response = await fetch(this.address, { headers });
        if (response.status !== 206) {
          throw failed();
        }
        return response.arrayBuffer();
      },
    };
  }
}

/** The file, when the page comes from `tav view`; it is told that the page is there, and when it goes. */
export function servedFile() {
  const name = document.querySelector('meta[name="tav-view"]').content;
  if (name === "") {
    return undefined;
  }
  const at = (what) => new URL(what, location.href.split("#")[0]).href;
  const tell = (what) => fetch(at(what), { keepalive: true }).catch(() => {});
  addEventListener("pageshow", () => tell("hello"));
  addEventListener("pagehide", () => tell("bye"));
  return (async () => {
    const response = await fetch(at("file"), { method: "HEAD" });
    if (!response.ok) {
      throw failed();
    }
    return new ServedFile(name, at("file"), Number(response.headers.get("Content-Length")), response.headers.get("ETag"));
  })();
}
