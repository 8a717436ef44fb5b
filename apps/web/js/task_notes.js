// What this browser knows of the tasks that it started: the server's record has no names. Shared by its tabs.

const KEY = "orvel.tasks";
const LIFE = 2 * 86400_000; // as long as the server keeps a record

function read() {
  try {
    return JSON.parse(localStorage.getItem(KEY)) ?? {};
  } catch {
    return {};
  }
}

function write(notes) {
  try {
    localStorage.setItem(KEY, JSON.stringify(notes));
  } catch {
    // Without storage a card says less.
  }
}

export function noteOf(taskid) {
  return read()[taskid] ?? {};
}

// Adds to what is known of the task: {count, name, target, bin, seen}
export function note(taskid, more) {
  const kept = Object.entries(read()).filter(([, one]) => Date.now() - one.at < LIFE);
  const notes = Object.fromEntries(kept);
  notes[taskid] = { at: Date.now(), ...notes[taskid], ...more };
  write(notes);
}

export function forget(taskid) {
  const { [taskid]: _, ...notes } = read();
  write(notes);
}
