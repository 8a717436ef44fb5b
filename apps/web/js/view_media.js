// Films and sound: subtitles that lie beside a film, and the place where somebody stopped.

import { get, readReply, send, urlOf } from "./api.js";
import { entryOf } from "./entries.js";
import { encodeName, patternOf, splitExtension } from "./path.js";
import { pref, setPref } from "./prefs.js";
import { detect } from "./text_codec.js";

const MOST_PLACES = 100;
const WORTH = 15; // seconds from either end
const SAVE_EVERY = 5000;
const LARGEST_SUBTITLES = 2 * 1024 * 1024;

// Begins where it was left last.
export function keepPlace(player, id, signal) {
  const places = () => pref("places", {});
  const { [id]: at } = places();
  if (at < player.duration - WORTH) player.currentTime = at;
  let saved = 0;
  const save = () => {
    saved = Date.now();
    const { [id]: old, ...others } = places();
    const worth = player.currentTime > WORTH && player.currentTime < player.duration - WORTH;
    const kept = Object.entries(others).slice(-MOST_PLACES + 1);
    setPref("places", Object.fromEntries(worth ? [...kept, [id, Math.floor(player.currentTime)]] : kept));
  };
  player.addEventListener("timeupdate", () => Date.now() - saved > SAVE_EVERY && save(), { signal });
  player.addEventListener("pause", save, { signal });
  player.addEventListener("ended", save, { signal });
  signal.addEventListener("abort", save);
}

// "film.srt", "film.de.vtt" beside "film.mp4" become tracks to choose from; the first one shows.
export async function addSubtitles(player, entry, signal) {
  const [stem] = splitExtension(entry.name);
  const pattern = `${patternOf(encodeName(stem))}*`;
  const { items } = await get("list", { action: "folder", path_raw: entry.parent, pattern, filetype: "file", limit: 100, additional: "size" }, signal);
  for (const found of items.map(entryOf)) {
    const [, language, kind] = /^\.?(.*)\.(vtt|srt)$/i.exec(found.name.slice(stem.length)) ?? [];
    if (!kind || !found.name.startsWith(`${stem}.`) || found.size > LARGEST_SUBTITLES) continue;
    const response = await send(urlOf("download", { path_raw: found.id }), { signal });
    if (!response.ok) readReply(response.status, await response.text());
    const bytes = new Uint8Array(await response.arrayBuffer());
    const cues = cuesOf(new TextDecoder(detect(bytes) ?? "utf-8").decode(bytes));
    if (cues.length === 0) continue;
    const track = player.addTextTrack("subtitles", language || found.name, /^[a-z]{2,3}(-\w+)?$/i.test(language) ? language : "");
    for (const cue of cues) track.addCue(cue);
    track.mode = player.textTracks.length === 1 ? "showing" : "disabled";
  }
}

const TIME = /(?:(\d+):)?(\d{1,2}):(\d{2})[.,](\d{1,3})/.source;
const LINE = new RegExp(`^\\s*${TIME}\\s*-->\\s*${TIME}`);

// Blocks of a line of times and lines of text, which both formats are made of.
export function cuesOf(text) {
  const cues = [];
  for (const block of text.replace(/\r\n?/g, "\n").split(/\n{2,}/)) {
    const lines = block.split("\n");
    const at = lines.findIndex((line) => LINE.test(line));
    if (at < 0) continue;
    const [, ...parts] = LINE.exec(lines[at]);
    const seconds = ([hours, minutes, rest, part]) => Number(hours ?? 0) * 3600 + Number(minutes) * 60 + Number(`${rest}.${part}`);
    const said = lines.slice(at + 1).join("\n").replace(/\{\\[^}]*\}|<\/?font[^>]*>/gi, "");
    const [start, end] = [seconds(parts.slice(0, 4)), seconds(parts.slice(4))];
    if (said !== "" && end > start) cues.push(new VTTCue(start, end, said));
  }
  return cues;
}
