// A network that breaks: what passes to the web server goes through here, and is cut off where a test says so.
import { connect, createServer } from "node:net";

export class CuttingNetwork {
  constructor(target) {
    this.target = new URL(target);
    this.left = Infinity; // bytes towards the server until the next cut
    this.cuts = 0;
    this.open = new Set();
    this.server = createServer((client) => this.join(client));
  }

  async listen() {
    await new Promise((resolve) => this.server.listen(0, "127.0.0.1", resolve));
    this.url = `http://127.0.0.1:${this.server.address().port}/`;
    return this;
  }

  cutAfter(bytes) {
    this.left = bytes;
  }

  join(client) {
    const server = connect(this.target.port, this.target.hostname);
    const pair = [client, server];
    this.open.add(pair);
    const end = () => {
      this.open.delete(pair);
      for (const one of pair) one.destroy();
    };
    for (const one of pair) one.on("error", end).on("close", end);
    server.pipe(client);
    client.on("data", (data) => {
      this.left -= data.length;
      if (this.left <= 0) this.cut();
      else if (!server.write(data)) {
        client.pause();
        server.once("drain", () => client.resume());
      }
    });
  }

  cut() {
    this.left = Infinity;
    ++this.cuts;
    for (const pair of this.open) for (const one of pair) one.destroy();
  }

  close() {
    this.cut();
    this.server.close();
  }
}
