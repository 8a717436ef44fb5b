// Holds the programs behind the page before an operation of the platform (see platform/linux/fault_gate.h).
import { chmodSync, readFileSync, renameSync, rmSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { until } from "./support.mjs";

// Shut from the start. Which operations can be held says tests/apps/served.sh.
export class Gate {
  constructor(operation) {
    this.operation = operation;
    this.file = join(process.env.ORVEL_TEST_GATES, operation);
    this.next();
  }

  // Waits until a program is held.
  holds() {
    return until(`somebody at the gate of ${this.operation}`, () => readFileSync(this.file).length > 0);
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
