// What the browser remembers of somebody's choices. Without storage (private windows) they last as long as the page.

const PREFIX = "orvel.";
const held = new Map();

export function pref(name, fallback) {
  if (held.has(name)) return held.get(name);
  try {
    const text = localStorage.getItem(PREFIX + name);
    return text === null ? fallback : JSON.parse(text);
  } catch {
    return fallback;
  }
}

export function setPref(name, value) {
  held.set(name, value);
  try {
    localStorage.setItem(PREFIX + name, JSON.stringify(value));
  } catch {
    // Held above.
  }
}
