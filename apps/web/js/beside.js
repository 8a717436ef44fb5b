// What came beside a listing, in the same reply: nobody asks for that again.

const brought = new Map();

export function bring(replies = {}) {
  for (const [name, reply] of Object.entries(replies)) brought.set(name, reply);
}

// Given once; asked for where it did not come.
export async function broughtOr(name, ask) {
  const reply = brought.get(name);
  brought.delete(name);
  return reply ?? ask();
}
