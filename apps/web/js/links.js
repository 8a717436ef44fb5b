// Public links; what asks about them is loaded when somebody wants it.

import { addCommand } from "./commands.js";
import { loaded } from "./dialogs.js";

const dialogs = () => loaded(import("./link_dialogs.js"));

addCommand({
  id: "share",
  icon: "link",
  keys: ["Mod+k"],
  group: "info",
  when: ({ single, inBin, canDownload }) => single && !inBin && canDownload,
  run: async ({ single }) => (await dialogs())?.makeLink(single),
});
addCommand({ id: "links", icon: "link", group: "info", run: async () => (await dialogs())?.showLinks() });
