// Numbers and times for people.

import { locale, t } from "./strings.js";

const UNITS = ["B", "KB", "MB", "GB", "TB", "PB"];
const DAY = 86400000;
let formats = null;

export function formatSize(bytes) {
  let unit = 0;
  let value = bytes;
  while (value >= 1000 && unit < UNITS.length - 1) {
    value /= 1024;
    ++unit;
  }
  const digits = unit === 0 || value >= 100 ? 0 : value >= 10 ? 1 : 2;
  return `${value.toLocaleString(locale, { maximumFractionDigits: digits })} ${UNITS[unit]}`;
}

function dateFormats() {
  formats ??= {
    time: new Intl.DateTimeFormat(locale, { hour: "2-digit", minute: "2-digit" }),
    near: new Intl.DateTimeFormat(locale, { day: "numeric", month: "short", hour: "2-digit", minute: "2-digit" }),
    far: new Intl.DateTimeFormat(locale, { day: "numeric", month: "short", year: "numeric" }),
    full: new Intl.DateTimeFormat(locale, { dateStyle: "full", timeStyle: "medium" }),
  };
  return formats;
}

export function formatTime(seconds) {
  if (!seconds) return "";
  const { time, near, far } = dateFormats();
  const date = new Date(seconds * 1000);
  const midnight = new Date().setHours(0, 0, 0, 0);
  if (date >= midnight && date < midnight + DAY) return t("time.today", { time: time.format(date) });
  if (date >= midnight - DAY && date < midnight) return t("time.yesterday", { time: time.format(date) });
  return (date.getFullYear() === new Date().getFullYear() ? near : far).format(date);
}

export function formatDay(seconds) {
  return seconds ? dateFormats().far.format(new Date(seconds * 1000)) : "";
}

export function formatFullTime(seconds) {
  return seconds ? dateFormats().full.format(new Date(seconds * 1000)) : "";
}

export function formatDuration(seconds) {
  if (!Number.isFinite(seconds) || seconds < 0) return "";
  if (seconds < 60) return t("time.seconds", { count: Math.ceil(seconds) });
  if (seconds < 3600) return t("time.minutes", { count: Math.round(seconds / 60) });
  return t("time.hours", { count: Math.round(seconds / 3600) });
}

// "755" as "rwxr-xr-x".
export function formatMode(posix) {
  return String(posix)
    .padStart(3, "0")
    .split("")
    .map((digit) =>
      "rwx"
        .split("")
        .map((letter, i) => (digit & (4 >> i) ? letter : "-"))
        .join(""),
    )
    .join("");
}
