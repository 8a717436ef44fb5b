// Holds the programs behind the page before an operation of the platform (see platform/linux/fault_gate.h).
import assert from "node:assert/strict";
import { chmodSync, readFileSync, renameSync, rmSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { setTimeout } from "node:timers/promises";

// Shut from the start. Which operations can be held says tests/apps/served.sh.
export class Gate {
  constructor(operation) {
    this.operation = operation;
    this.file = join(process.env.ORVEL_TEST_GATES, operation);
    this.next();
  }

  // Waits until a program is held.
  async holds() {
    for (let i = 0; i < 3000; ++i) {
      if (readFileSync(this.file).length > 0) return;
      await setTimeout(10);
    }
    assert.fail(`waited half a minute in vain for somebody at the gate of ${this.operation}`);
  }

  // Lets the one that is held pass, and holds the next.
  next() {
    writeFileSync(`${this.file}.new`, "");
    chmodSync(`${this.file}.new`, 0o666);
    renameSync(`${this.file}.new`, this.file);
  }

  open() {
    rmSync(this.file, { force: true });
  }
}
