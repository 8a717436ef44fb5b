// What somebody dropped or chose, as files with their way from the target folder: [{file, parts}], and folders that
// hold nothing: {parts}.

export function fromInput(input) {
  return [...input.files].map((file) => ({ file, parts: (file.webkitRelativePath || file.name).split("/") }));
}

// The data of a drop is gone after its event: what is in it is taken at once, the folders are read after.
export function fromDrop(transfer) {
  const entries = [...transfer.items]
    .filter((item) => item.kind === "file")
    .map((item) => item.webkitGetAsEntry?.())
    .filter(Boolean);
  const plain = entries.length === 0 ? [...transfer.files] : [];
  return async () => {
    const found = plain.map((file) => ({ file, parts: [file.name] }));
    for (const entry of entries) await walk(entry, [entry.name], found);
    return found;
  };
}

async function walk(entry, parts, found) {
  if (entry.isFile) {
    found.push({ file: await new Promise((resolve, reject) => entry.file(resolve, reject)), parts });
    return;
  }
  const reader = entry.createReader();
  let empty = true;
  for (;;) {
    const some = await new Promise((resolve, reject) => reader.readEntries(resolve, reject));
    if (some.length === 0) break;
    empty = false;
    for (const one of some) await walk(one, [...parts, one.name], found);
  }
  if (empty) found.push({ parts });
}

export function holdsFiles(transfer) {
  return [...transfer.types].includes("Files");
}
