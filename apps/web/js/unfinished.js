// Uploads that somebody began and did not finish, each with a card: a browser gives a file only to who chooses it again.

import { Card } from "./activity.js";
import { toast, toastFailure } from "./dialogs.js";
import { h, plainName } from "./dom.js";
import { formatFullTime, formatSize } from "./format.js";
import "./later.js";
import { nameOf, parentOf } from "./path.js";
import { labelOf } from "./pathbar.js";
import { t } from "./strings.js";
import { discard, isOf, unfinishedUploads } from "./upload_resume.js";
import { isUploading, startUpload } from "./uploads.js";

const MOST_CARDS = 10;

export async function showUnfinished() {
  const items = await unfinishedUploads().catch(() => []);
  for (const item of items.filter(({ id }) => !isUploading(id)).slice(-MOST_CARDS)) show(item);
}

function show(item) {
  const name = plainName(nameOf(item.path));
  const card = new Card({
    iconName: "upload",
    title: t("unfinished.title", { name, folder: labelOf(parentOf(item.path)) }),
    onCancel: () => {},
  });
  const state = t("size.of", { done: formatSize(item.offset), total: formatSize(item.size) });
  card.finish("stopped", `${state} · ${t("unfinished.until", { time: formatFullTime(item.expires) })}`, [
    { label: t("unfinished.choose"), run: () => chooseAgain(item, card) },
    { label: t("unfinished.discard"), run: () => drop(item, card) },
  ]);
}

function chooseAgain(item, card) {
  const input = h("input", { type: "file" });
  input.addEventListener("change", () => {
    const [file] = input.files;
    const name = nameOf(item.path);
    if (!isOf(item, item.path, file)) return toast({ text: t("unfinished.other", { name: plainName(name) }), hint: t("unfinished.other.hint"), kind: "failed" });
    card.remove();
    return startUpload([{ file, parts: [name] }], parentOf(item.path));
  });
  input.click();
}

async function drop(item, card) {
  try {
    if (await discard(item.id)) card.remove();
    else toast({ text: t("unfinished.busy"), kind: "failed" });
  } catch (failure) {
    toastFailure(failure, item.path);
  }
}
