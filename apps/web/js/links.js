// Public links; what asks about them is loaded when somebody wants it.

import { addCommand } from "./commands.js";
import { loaded } from "./dialogs.js";
import { hasLink } from "./link_marks.js";

const dialogs = () => loaded(import("./link_dialogs.js"));

addCommand({
  id: "share",
  icon: "link",
  keys: ["Mod+k"],
  group: "info",
  when: ({ single, inBin, canDownload }) => single && !inBin && canDownload,
  run: async ({ single }) => (await dialogs())?.makeLink(single),
});
addCommand({
  id: "receive",
  icon: "upload",
  group: "info",
  when: ({ single, inBin }) => Boolean(single?.isFolder && !inBin),
  run: async ({ single }) => (await dialogs())?.receiveFiles(single),
});
addCommand({
  id: "itemLinks",
  icon: "link",
  group: "info",
  when: ({ single }) => Boolean(single && hasLink(single.id)),
  run: async ({ single }) => (await dialogs())?.showLinks(single),
});
addCommand({ id: "links", icon: "link", group: "info", run: async () => (await dialogs())?.showLinks() });
