// Elements from data. What comes from a stream gets into the page as text and no other way.

/** `h("button", {class: "x", onclick: f, "aria-label": "…"}, "text", child)` */
export function h(name, attributes = {}, ...children) {
  const element = document.createElement(name);
  for (const [key, value] of Object.entries(attributes)) {
    if (typeof value === "function") {
      element.addEventListener(key.slice(2), value);
    } else if (value === true && !key.startsWith("aria-")) {
      element.setAttribute(key, "");
    } else if (value !== undefined && (value !== false || key.startsWith("aria-"))) {
      element.setAttribute(key, String(value));
    }
  }
  element.append(...children.filter((child) => child !== undefined).map((child) =>
    typeof child === "number" ? String(child) : child));
  return element;
}

export const byId = (id) => document.getElementById(id);

export function fill(element, ...children) {
  element.replaceChildren(...children.filter((child) => child !== undefined));
}

export const hex = (offset) => "0x" + Number(offset).toString(16);

export const counted = (count, word) => `${Number(count).toLocaleString("en")} ${word}${Number(count) === 1 ? "" : "s"}`;

/** Hands a file to the user. */
export function save(blob, name) {
  const address = URL.createObjectURL(blob);
  const link = h("a", { href: address, download: name });
  document.body.append(link);
  link.click();
  link.remove();
  setTimeout(() => URL.revokeObjectURL(address), 60_000);
}

export async function copy(text) {
  try {
    await navigator.clipboard.writeText(text);
  } catch {
    const area = h("textarea", { class: "offscreen" }); // pages from a disk may not ask for the clipboard
    area.value = text;
    document.body.append(area);
    area.select();
    document.execCommand("copy");
    area.remove();
  }
}
