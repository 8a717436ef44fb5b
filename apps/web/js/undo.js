// What this tab has done and can undo, the last one last. How, the server knows; here is only what it is called.

const MOST = 20;
let done = []; // {id, title, folders}

// `id` is what the program undoes; `folders`: those whose content it changed.
export function canUndo(one) {
  done = [...done.filter(({ id }) => id !== one.id), one].slice(-MOST);
}

export function lastDone() {
  return done.at(-1);
}

export function isUndone(id) {
  done = done.filter((one) => one.id !== id);
}
