// Numbers over time, or over the rows where there is no time: a line a column.
const SPACE = "http://www.w3.org/2000/svg";
const WIDE = 640;
const HIGH = 200;
const MOST = 2000; // points of a line; of more rows the lowest and highest of each stretch

function s(name, attributes, text) {
  const element = document.createElementNS(SPACE, name);
  for (const [key, value] of Object.entries(attributes)) {
    element.setAttribute(key, value);
  }
  element.textContent = text ?? "";
  return element;
}

function thinned(points) {
  if (points.length <= MOST) {
    return points;
  }
  const kept = [];
  const stretch = Math.ceil(points.length / (MOST / 2));
  for (let from = 0; from < points.length; from += stretch) {
    const part = points.slice(from, from + stretch);
    const low = part.reduce((a, b) => (b[1] < a[1] ? b : a));
    const high = part.reduce((a, b) => (b[1] > a[1] ? b : a));
    kept.push(...[low, high].sort((a, b) => a[0] - b[0]));
  }
  return kept;
}

/** `time` is a column's number, or -1; `numbers` are those of the lines. */
export function drawPlot(svg, { names, rows }, time, numbers) {
  const lines = numbers.map((column) => thinned(rows.flatMap((row, i) => {
    const x = time < 0 ? i : Date.parse(row[time]);
    return row[column] === null || Number.isNaN(x) ? [] : [[x, Number(row[column])]];
  })));
  const all = lines.flat();
  svg.replaceChildren();
  svg.setAttribute("viewBox", `0 0 ${WIDE} ${HIGH}`);
  if (all.length === 0) {
    return;
  }
  const range = (values) => values.reduce(([low, high], v) => [Math.min(low, v), Math.max(high, v)], [Infinity, -Infinity]);
  const [left, right] = range(all.map(([x]) => x));
  const [low, high] = range(all.map(([, y]) => y));
  const x = (value) => 60 + ((value - left) / (right - left || 1)) * (WIDE - 70);
  const y = (value) => HIGH - 24 - ((value - low) / (high - low || 1)) * (HIGH - 44);
  const tell = (value) => (time < 0 ? String(value) : new Date(value).toISOString().slice(0, 19));
  svg.append(
    s("text", { x: 2, y: y(high) + 4 }, high), s("text", { x: 2, y: y(low) + 4 }, low),
    s("text", { x: 60, y: HIGH - 6 }, tell(left)), s("text", { x: WIDE - 10, y: HIGH - 6, "text-anchor": "end" }, tell(right)));
  lines.forEach((points, i) => {
    svg.append(s("polyline", { class: `line${i % 6}`, fill: "none", points: points.map(([a, b]) => `${x(a).toFixed(1)},${y(b).toFixed(1)}`).join(" ") }));
    svg.append(s("text", { x: 66 + i * 110, y: 12, class: `line${i % 6}` }, names[numbers[i]]));
  });
  svg.append(s("title", {}, `${numbers.map((n) => names[n]).join(", ")}: from ${low} to ${high}`));
}
