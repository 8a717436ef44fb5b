// Text from bytes, and back to the same bytes.

export const ENCODINGS = {
  "utf-8": "UTF-8",
  "utf-16le": "UTF-16 LE",
  "utf-16be": "UTF-16 BE",
  "windows-1252": "Windows-1252 (Latin-1)",
  "iso-8859-15": "ISO 8859-15",
  "windows-1250": "Windows-1250",
  "iso-8859-2": "ISO 8859-2",
  "windows-1251": "Windows-1251",
  "koi8-r": "KOI8-R",
  "windows-1253": "Windows-1253",
  "windows-1254": "Windows-1254",
  "shift_jis": "Shift JIS",
  "euc-jp": "EUC-JP",
  "gb18030": "GB 18030",
  "big5": "Big5",
  "euc-kr": "EUC-KR",
};

const BOMS = { "utf-8": [0xef, 0xbb, 0xbf], "utf-16le": [0xff, 0xfe], "utf-16be": [0xfe, 0xff] };
const LOOKED_AT = 4096; // bytes in which a NUL says that it is no text

// Of a character that its encoding does not have. `at` counts from the text's beginning.
export class Unencodable extends Error {
  constructor(character, at) {
    super(`U+${character.codePointAt(0).toString(16)}`);
    this.character = character;
    this.at = at;
  }
}

// By the byte order mark, else UTF-8 where it is valid, else what single bytes mean most often; null for what is no
// text. `cut`: there is more of it, and the end may lie within a character.
export function detect(bytes, cut = false) {
  for (const [encoding, bom] of Object.entries(BOMS)) if (bom.every((byte, i) => bytes[i] === byte)) return encoding;
  if (bytes.subarray(0, LOOKED_AT).includes(0)) return null;
  try {
    new TextDecoder("utf-8", { fatal: true }).decode(bytes, { stream: cut });
    return "utf-8";
  } catch {
    return "windows-1252";
  }
}

// {text, encoding, bom, exact}: `exact` when the text gives these very bytes again.
export function decode(bytes, encoding) {
  const mark = BOMS[encoding] ?? [];
  const bom = mark.length > 0 && mark.every((byte, i) => bytes[i] === byte);
  const text = new TextDecoder(encoding, { ignoreBOM: true }).decode(bom ? bytes.subarray(mark.length) : bytes);
  const decoded = { text, encoding, bom };
  let again = null;
  try {
    again = encode(text, decoded);
  } catch {
    // Not to be written again.
  }
  return { ...decoded, exact: again !== null && again.length === bytes.length && again.every((byte, i) => byte === bytes[i]) };
}

// Throws Unencodable, and RangeError for an encoding that is only read.
export function encode(text, { encoding, bom }) {
  const mark = bom ? BOMS[encoding] : [];
  const body =
    encoding === "utf-8" ? utf8(text) : encoding.startsWith("utf-16") ? utf16(text, encoding === "utf-16le") : single(text, encoding);
  const bytes = new Uint8Array(mark.length + body.length);
  bytes.set(mark);
  bytes.set(body, mark.length);
  return bytes;
}

export function canEncode(encoding) {
  return encoding.startsWith("utf-") || tableOf(encoding) !== null;
}

function utf8(text) {
  const lone = text.search(/\p{Surrogate}/u);
  if (lone >= 0) throw new Unencodable(text[lone], lone);
  return new TextEncoder().encode(text);
}

function utf16(text, little) {
  const bytes = new Uint8Array(text.length * 2);
  const view = new DataView(bytes.buffer);
  for (let i = 0; i < text.length; ++i) view.setUint16(i * 2, text.charCodeAt(i), little);
  return bytes;
}

const tables = new Map();

// Which byte a character is, as the browser reads each of the 256; null where bytes come in groups.
function tableOf(encoding) {
  if (!tables.has(encoding)) {
    const table = new Map();
    for (let byte = 0; byte < 256; ++byte) {
      const character = new TextDecoder(encoding).decode(Uint8Array.of(byte));
      if (character !== "\uFFFD") table.set(character, byte);
    }
    const wide = ["shift_jis", "euc-jp", "gb18030", "big5", "euc-kr"].includes(encoding);
    tables.set(encoding, wide ? null : table);
  }
  return tables.get(encoding);
}

function single(text, encoding) {
  const table = tableOf(encoding);
  if (table === null) throw new RangeError(encoding);
  const bytes = new Uint8Array(text.length);
  let at = 0;
  for (const character of text) {
    const byte = table.get(character);
    if (byte === undefined) throw new Unencodable(character, at);
    bytes[at++] = byte; // as long as no character takes two units, both counts are one
  }
  return bytes;
}

// How the lines of a text end: "\r\n", "\n" or "\r" when all do so, "mixed", or null for a single line.
export function lineEnds(text) {
  const found = new Set(text.match(/\r\n|\n|\r/g));
  return found.size > 1 ? "mixed" : ([...found][0] ?? null);
}
