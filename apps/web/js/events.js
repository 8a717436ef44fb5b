// What happens in the page, told by name to whoever wants to know.

const listeners = new Map();

export function on(name, listener) {
  if (!listeners.has(name)) listeners.set(name, new Set());
  listeners.get(name).add(listener);
  return () => listeners.get(name).delete(listener);
}

// The first place is there. What is asked beside it waits for this.
export const arrived = new Promise((resolve) => on("arrived", resolve));

export function emit(name, detail) {
  for (const listener of listeners.get(name) ?? []) listener(detail);
}
