// Areas in proportion to sizes, as square as can be.

// `sizes` in falling order, all above zero. {left, top, width, height} of each, in parts of a box of that shape.
export function treemap(sizes, width, height) {
  const boxes = [];
  const total = sizes.reduce((sum, size) => sum + size, 0);
  const areas = sizes.map((size) => (size / total) * width * height);
  let room = { left: 0, top: 0, width, height };
  for (let first = 0; first < areas.length;) {
    const side = Math.min(room.width, room.height);
    let end = first + 1;
    let sum = areas[first];
    // A row takes one more as long as that makes its tiles no longer.
    while (end < areas.length && longest(areas[first], areas[end], sum + areas[end], side) <= longest(areas[first], areas[end - 1], sum, side)) {
      sum += areas[end];
      ++end;
    }
    room = layRow(areas.slice(first, end), sum, room, boxes);
    first = end;
  }
  return boxes.map((box) => ({ left: box.left / width, top: box.top / height, width: box.width / width, height: box.height / height }));
}

// How much longer than wide the worst tile of a row is, which has the sum as its area and this length.
function longest(largest, least, sum, side) {
  return Math.max((side * side * largest) / (sum * sum), (sum * sum) / (side * side * least));
}

// Puts a row at the shorter side; the room that is left.
function layRow(areas, sum, { left, top, width, height }, boxes) {
  const across = width >= height;
  const depth = sum / (across ? height : width);
  let at = 0;
  for (const area of areas) {
    const length = area / depth;
    boxes.push(across ? { left, top: top + at, width: depth, height: length } : { left: left + at, top, width: length, height: depth });
    at += length;
  }
  return across
    ? { left: left + depth, top, width: Math.max(0, width - depth), height }
    : { left, top: top + depth, width, height: Math.max(0, height - depth) };
}
