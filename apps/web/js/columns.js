// Which columns a list has, how wide they are, which of them there is room for, and how high a row is.

import { emit } from "./events.js";
import { typeOf } from "./entries.js";
import { formatFullTime, formatMode, formatSize, formatTime } from "./format.js";
import { plainName } from "./dom.js";
import { openMenu } from "./menu.js";
import { decode } from "./path.js";
import { pref, setPref } from "./prefs.js";
import { t } from "./strings.js";

const NAME_LEAST = 230; // pixels; a column that would take from that is left out
const BESIDE = 100; // the tick, the button, the margins

// `sort` is the server's name of the order, `width` what it takes, `grows` how much of what is left over goes to it.
export const COLUMNS = {
  name: { id: "name", sort: "name" },
  folder: { id: "folder", sort: "ppath", width: 180, grows: 3, text: (entry) => plainName(decode(entry.parent)) },
  size: { id: "size", sort: "size", width: 88, grows: 0, text: (entry) => (entry.size === null ? "" : formatSize(entry.size)) },
  mtime: timeColumn("mtime", (entry) => entry.mtime),
  type: { id: "type", sort: "type", width: 120, grows: 0.6, text: typeOf },
  owner: { id: "owner", sort: "user", width: 96, grows: 0.6, text: (entry) => entry.owner },
  group: { id: "group", sort: "group", width: 96, grows: 0.6, text: (entry) => entry.group },
  crtime: timeColumn("crtime", (entry) => entry.time?.crtime),
  posix: { id: "posix", sort: "posix", width: 100, grows: 0, text: (entry) => (entry.perm ? formatMode(entry.perm.posix) : "") },
};
// Of what was deleted. Where nobody recorded it the date is the best that is known, and nobody is named.
const about = (text) => (entry) => (entry.deleted ? text(entry.deleted) : "");
Object.assign(COLUMNS, {
  from: { id: "from", sort: "from", width: 180, grows: 3, text: about(({ from }) => plainName(decode(from))) },
  deleted: {
    id: "deleted",
    sort: "deleted",
    width: 150,
    grows: 0.4,
    text: about(({ time, recorded }) => (recorded ? formatTime(time) : t("deleted.about", { time: formatTime(time) }))),
    title: about(({ time, recorded }) => (recorded ? formatFullTime(time) : t("deleted.about.hint"))),
  },
  by: { id: "by", sort: "deleter", width: 96, grows: 0.6, text: about(({ by, recorded }) => (recorded ? by : t("deleted.unknown"))) },
});
const OF_DELETED = ["name", "from", "deleted", "by", "size"];
export const DELETED_SORTS = ["deleted", "name", "from", "deleter", "size"];

// The ones to the right go first where there is no room.
const OPTIONAL = ["size", "mtime", "type", "owner", "group", "crtime", "posix"];
const USUAL = ["size", "mtime", "type", "owner"];
const DENSITIES = ["roomy", "dense"];

function timeColumn(id, timeOf) {
  return {
    id,
    sort: id,
    width: 150,
    grows: 0.4,
    text: (entry) => formatTime(timeOf(entry)),
    title: (entry) => formatFullTime(timeOf(entry)),
  };
}

function wanted() {
  const kept = pref("columns", USUAL);
  return OPTIONAL.filter((id) => kept.includes(id));
}

// Those of a folder, or of a search, which says where each entry lies.
export function chosenColumns(search, sort, deleted = false) {
  const ids = deleted ? OF_DELETED : search ? ["name", "folder", ...wanted().filter((id) => id !== "owner")] : ["name", ...wanted()];
  return ids.map((id) => ({
    ...COLUMNS[id],
    sorted: COLUMNS[id].sort !== sort.by ? null : sort.ascending ? "ascending" : "descending",
  }));
}

// What of it fits, and the widths as a grid template.
export function fitColumns(columns, room) {
  const fitting = [...columns];
  const taken = () => BESIDE + NAME_LEAST + fitting.reduce((sum, { width = 0 }) => sum + width, 0);
  const least = columns.some(({ id }) => id === "folder" || id === "from") ? 2 : 1; // where a found entry lies is always said
  while (fitting.length > least && taken() > room) fitting.pop();
  const template = fitting.map(({ id, width, grows }) =>
    id === "name" ? "minmax(0, 4fr)" : grows > 0 ? `minmax(${taken() > room ? 0 : width}px, ${grows}fr)` : `${width}px`,
  );
  return { fitting, template: template.join(" ") };
}

export function applyDensity() {
  document.documentElement.dataset.density = pref("density", DENSITIES[0]);
}

function change(name, value) {
  setPref(name, value);
  applyDensity();
  emit("columns");
}

export function openColumnMenu(at) {
  const shown = wanted();
  openMenu(
    [
      { heading: t("density.title") },
      ...DENSITIES.map((one) => ({
        label: t(`density.${one}`),
        checked: pref("density", DENSITIES[0]) === one,
        run: () => change("density", one),
      })),
      { heading: t("columns.title") },
      ...OPTIONAL.map((id) => ({
        label: t(`column.${id}`),
        checked: shown.includes(id),
        several: true,
        run: () => change("columns", shown.includes(id) ? shown.filter((one) => one !== id) : [...shown, id]),
      })),
    ],
    at,
  );
}
