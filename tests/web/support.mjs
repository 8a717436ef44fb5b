// What the tests of both browsers stand on.
import assert from "node:assert/strict";
import { chmodSync, mkdirSync, rmSync, writeFileSync } from "node:fs";
import { dirname, join } from "node:path";
import { after } from "node:test";
import { setTimeout } from "node:timers/promises";

// In milliseconds: what has not come by then does not come, on however slow a machine.
export const LONGEST = 120_000;
// For requests of a test's own: the web server may close a connection that stood idle just as it is used again.
export const AGAIN = { maxRetries: 5 };
const { ORVEL_TEST_PROJECTS: projects, ORVEL_TEST_WORK: work } = process.env;

// Looks again and again; what it found.
export async function until(what, look) {
  for (const end = Date.now() + LONGEST; Date.now() < end; await setTimeout(20)) {
    const found = await look();
    if (found) return found;
  }
  return assert.fail(`waited in vain for ${what}`);
}

// Files by name; a name that ends with "/" is a folder. Everybody may change them.
export function write(folder, files) {
  for (const [name, content] of Object.entries(files)) {
    const path = join(folder, name);
    mkdirSync(name.endsWith("/") ? path : dirname(path), { recursive: true });
    if (!name.endsWith("/")) writeFileSync(path, content);
    chmodSync(path, name.endsWith("/") ? 0o777 : 0o666);
  }
}

// A folder of the test's own in the share "projects"; its real path. It goes with the file of tests: rows that others look
// for there stay in sight.
const own = new Set();
after(() => own.forEach((folder) => rmSync(folder, { recursive: true, force: true, maxRetries: 5 })));

export function ownFolder(name, files = {}) {
  const folder = join(projects, name);
  rmSync(folder, { recursive: true, force: true, maxRetries: 5 });
  own.add(join(projects, name.split("/")[0]));
  mkdirSync(folder, { recursive: true });
  chmodSync(folder, 0o777);
  write(folder, files);
  return folder;
}

// Files to be uploaded.
export function localFiles(name, files) {
  const folder = join(work, name);
  mkdirSync(folder);
  write(folder, files);
  return folder;
}
