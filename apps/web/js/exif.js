// The small picture that a camera puts into the head of a JPEG file.

const LITTLE = new Map([[0x4949, true], [0x4d4d, false]]); // "II", "MM": the first byte of a number is the least, the most
const ORIENTATION = 0x0112;
const OFFSET = 0x0201;
const LENGTH = 0x0202;

// `bytes`: the beginning of the file. {jpeg, orientation, width, height}, the last two of the whole picture (0 when they
// come later); null when there is none.
export function embeddedPicture(bytes) {
  const data = new DataView(bytes.buffer, bytes.byteOffset, bytes.byteLength);
  try {
    return read(data, bytes);
  } catch (failure) {
    if (failure instanceof RangeError) return null; // it points past what there is
    throw failure;
  }
}

function read(data, bytes) {
  if (data.getUint16(0) !== 0xffd8) return null;
  let found = null;
  let at = 2;
  while (at + 9 < bytes.length && data.getUint8(at) === 0xff) {
    const mark = data.getUint8(at + 1);
    const length = data.getUint16(at + 2);
    if (mark === 0xe1 && data.getUint32(at + 4) === 0x45786966) found ??= readExif(data, bytes, at + 10);
    // A frame: sizes; not the tables that have marks of the same range.
    if (mark >= 0xc0 && mark <= 0xcf && ![0xc4, 0xc8, 0xcc].includes(mark))
      return found && { ...found, height: data.getUint16(at + 5), width: data.getUint16(at + 7) };
    if (mark === 0xda) break;
    at += 2 + length;
  }
  return found && { ...found, width: 0, height: 0 };
}

function readExif(data, bytes, base) {
  const little = LITTLE.get(data.getUint16(base));
  if (little === undefined) return null;
  const word = (at) => data.getUint16(base + at, little);
  const long = (at) => data.getUint32(base + at, little);
  const fields = (at) => {
    const values = new Map();
    const count = word(at);
    for (let i = 0; i < count; ++i) {
      const field = at + 2 + 12 * i;
      values.set(word(field), word(field + 2) === 3 ? word(field + 8) : long(field + 8));
    }
    return { values, next: long(at + 2 + 12 * count) };
  };
  const main = fields(long(4));
  if (main.next === 0) return null;
  const { values } = fields(main.next);
  const start = base + (values.get(OFFSET) ?? 0);
  const jpeg = bytes.subarray(start, start + (values.get(LENGTH) ?? 0));
  if (jpeg.length < 100 || jpeg[0] !== 0xff || jpeg[1] !== 0xd8) return null;
  return { jpeg, orientation: main.values.get(ORIENTATION) ?? 1 };
}
