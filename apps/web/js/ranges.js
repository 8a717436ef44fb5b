// Rows as ranges [first, last], both included, in order and apart.

export function countOf(ranges) {
  return ranges.reduce((sum, [first, last]) => sum + last - first + 1, 0);
}

export function holds(ranges, row) {
  let low = 0;
  let high = ranges.length - 1;
  while (low <= high) {
    const middle = (low + high) >> 1;
    const [first, last] = ranges[middle];
    if (row < first) high = middle - 1;
    else if (row > last) low = middle + 1;
    else return true;
  }
  return false;
}

export function withRange(ranges, first, last) {
  const apart = ranges.filter(([from, to]) => to < first - 1 || from > last + 1);
  const joined = ranges.filter(([from, to]) => to >= first - 1 && from <= last + 1);
  const from = Math.min(first, ...joined.map((range) => range[0]));
  const to = Math.max(last, ...joined.map((range) => range[1]));
  return [...apart, [from, to]].sort((a, b) => a[0] - b[0]);
}

export function withoutRow(ranges, row) {
  return ranges.flatMap(([first, last]) => {
    if (row < first || row > last) return [[first, last]];
    return [
      [first, row - 1],
      [row + 1, last],
    ].filter(([from, to]) => from <= to);
  });
}

// As the programs say them.
export function textOf(ranges) {
  return ranges.map(([first, last]) => (first === last ? `${first}` : `${first}-${last}`)).join(",");
}

export function parse(text) {
  return text === ""
    ? []
    : text.split(",").map((range) => {
        const [first, last = first] = range.split("-").map(Number);
        return [first, last];
      });
}
