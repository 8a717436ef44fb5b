// Downloads: a file as it is; several, or a folder, as one zip.

import { ApiError, PROGRAMS, readReply } from "./api.js";
import { Choice } from "./choice.js";
import { toast, toastFailure } from "./dialogs.js";
import { h, plainName } from "./dom.js";
import { nameOf } from "./path.js";
import { t } from "./strings.js";

const LIFE = 600_000; // of a frame: a download that has begun goes on without it

// Entries or a choice. What goes wrong comes back as a reply in the frame.
export function download(what) {
  const choice = Choice.of(what);
  if (choice.count === 0) return undefined;
  const [first, more] = choice.portions();
  if (more) return toastFailure(new ApiError({ key: "page:too_many" }));
  const name = choice.count > 1 && (plainName(nameOf(choice.folders[0])) || "download");
  submit({ ...first.params, ...(name && { name }) }, choice.single?.id ?? choice.folders[0]);
  if (!choice.single || choice.single.isFolder) toast({ text: t("download.zip", { count: choice.count }) });
  return undefined;
}

// Asks for a download; `id` is what a failure is about.
export function submit(params, id) {
  const frame = h("iframe", { name: `download-${Date.now()}`, hidden: true, title: "" });
  const field = (name, value) => h("input", { type: "hidden", name, value });
  const form = h(
    "form",
    { method: "post", action: `${PROGRAMS}download`, target: frame.name, hidden: true },
    // The value of a hidden field keeps its line breaks, an attribute as it stands.
    Object.entries(params).map(([name, value]) => field(name, value)),
  );
  document.body.append(frame, form);
  frame.addEventListener("load", () => readFrame(frame, id));
  form.submit();
  form.remove();
  setTimeout(() => frame.remove(), LIFE);
}

function readFrame(frame, id) {
  const text = frame.contentDocument?.body?.textContent;
  if (text === "") return;
  try {
    // The browser's own page about a failure cannot be looked into.
    if (text === undefined) throw new ApiError({ key: "page:unreachable" });
    const [came] = frame.contentWindow.performance.getEntriesByType("navigation");
    readReply(came?.responseStatus ?? 0, text);
  } catch (failure) {
    toastFailure(failure, id);
  }
}
