// Downloads: a file as it is; several, or a folder, as one zip.

import { ApiError, PROGRAMS, readReply } from "./api.js";
import { toast, toastFailure } from "./dialogs.js";
import { h, plainName } from "./dom.js";
import { nameOf, parentOf, pathLists } from "./path.js";
import { t } from "./strings.js";

const LIFE = 600_000; // of a frame: a download that has begun goes on without it

// What goes wrong comes back as a reply in the frame.
export function download(entries) {
  if (entries.length === 0) return undefined;
  const lists = pathLists(entries.map((entry) => entry.id));
  if (lists.length > 1) return toastFailure(new ApiError({ key: "page:too_many" }));
  const frame = h("iframe", { name: `download-${Date.now()}`, hidden: true, title: "" });
  const field = (name, value) => h("input", { type: "hidden", name, value });
  const form = h(
    "form",
    { method: "post", action: `${PROGRAMS}download`, target: frame.name, hidden: true },
    // The value of a hidden field keeps its line breaks, an attribute as it stands.
    field("paths_raw", lists[0].join("\n")),
    entries.length > 1 && field("name", plainName(nameOf(parentOf(entries[0].id))) || "download"),
  );
  document.body.append(frame, form);
  frame.addEventListener("load", () => readFrame(frame, entries[0].id));
  form.submit();
  form.remove();
  setTimeout(() => frame.remove(), LIFE);
  if (entries.length > 1 || entries[0].isFolder) toast({ text: t("download.zip", { count: entries.length }) });
  return undefined;
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
