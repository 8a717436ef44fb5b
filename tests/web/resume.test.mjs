// Uploads of large files that go on: after a network that breaks, a reload, and by another maker's client.
import assert from "node:assert/strict";
import { randomBytes } from "node:crypto";
import { readFileSync, statSync } from "node:fs";
import { join } from "node:path";
import { after, before, test } from "node:test";
import * as tus from "tus-js-client";
import { cardOf, PASSWORDS, unfinished, upload, URL_OF_PAGE, wentWell, withPage } from "./browser.mjs";
import { CuttingNetwork } from "./cutting.mjs";
import { AGAIN, localFiles, ownFolder } from "./support.mjs";

const MIB = 1024 * 1024;
const SIZE = 32 * MIB; // more than all buffers on the way hold
const folder = ownFolder("resume");
const data = randomBytes(SIZE);
const files = localFiles("resume", { "film.bin": data, "other.bin": data.subarray(0, 9 * MIB) });
const login = `Basic ${Buffer.from(`alice:${PASSWORDS.alice}`).toString("base64")}`;
let network;

before(async () => {
  network = await new CuttingNetwork(URL_OF_PAGE).listen();
});
after(() => network.close());

function arrived(name) {
  assert.ok(readFileSync(join(folder, name)).equals(data), `${name} is not what was sent`);
}

test("tus-js-client: an upload that is cut off twice goes on", async () => {
  network.cutAfter(20 * MIB);
  const offsets = [];
  await new Promise((resolve, reject) => {
    const client = new tus.Upload(data, {
      endpoint: `${network.url}cgi-bin/tus?path=/projects/resume`,
      metadata: { filename: "by tus.bin" },
      headers: { Authorization: login },
      retryDelays: Array(30).fill(1000),
      onAfterResponse: (request, response) => {
        if (request.getMethod() !== "HEAD") return;
        offsets.push(Number(response.getHeader("Upload-Offset")));
        if (network.cuts < 2) network.cutAfter(4 * MIB);
      },
      onError: reject,
      onSuccess: resolve,
    });
    client.start();
  });
  assert.equal(network.cuts, 2);
  assert.ok(offsets.at(-1) > 0, `it began anew: ${offsets}`);
  arrived("by tus.bin");
});

test("the page: goes on by itself when the network is back", () =>
  withPage("alice", {}, async (page) => {
    await page.goto(`${network.url}#/projects/resume`);
    await page.waitForSelector("#view[aria-busy=false]");
    const begun = network.cuts;
    const offsets = [];
    page.on("request", (request) => {
      if (request.method() === "PATCH") offsets.push(Number(request.headers()["upload-offset"]));
    });
    network.cutAfter(20 * MIB);
    await upload(page, "Upload files", join(files, "film.bin"));
    await wentWell(page, "1 file uploaded");
    assert.equal(network.cuts, begun + 1);
    assert.ok(offsets.length > 1 && offsets.at(-1) > 0, `it began anew: ${offsets}`);
    arrived("film.bin");
    assert.equal(Math.floor(statSync(join(folder, "film.bin")).mtimeMs / 1000), Math.floor(statSync(join(files, "film.bin")).mtimeMs / 1000));
    // That the connection broke, that the server was not done with it yet (423), or was after it had been asked (409).
    page.complaints = page.complaints.filter((text) => !/ERR_|409|423/.test(text));
  }));

// What a closed browser leaves: the first piece has arrived.
async function begin(request, name, file, piece) {
  const modified = Math.floor(statSync(file).mtimeMs / 1000);
  const headers = { "Tus-Resumable": "1.0.0", "Content-Type": "application/offset+octet-stream" };
  const address = `${URL_OF_PAGE}cgi-bin/tus?path=/projects/resume/${name}&mtime=${modified}`;
  const reply = await request.fetch(address, { method: "POST", headers: { ...headers, "Upload-Length": `${statSync(file).size}` }, data: piece, ...AGAIN });
  assert.equal(reply.status(), 201);
}

test("the page: what a closed browser left goes on with the file chosen again", () =>
  withPage("alice", { path: "/projects/resume" }, async (page) => {
    const { request } = page.context();
    await begin(request, "left.bin", join(files, "film.bin"), data.subarray(0, 5 * MIB));
    await begin(request, "dropped.bin", join(files, "other.bin"), Buffer.alloc(1));
    const offsets = [];
    page.on("request", (one) => {
      if (one.method() === "PATCH") offsets.push(one.headers()["upload-offset"]);
    });
    await page.reload();
    const left = cardOf(page, "Not finished: “left.bin”");
    await left.waitFor();
    const choose = async (file) => {
      const chooser = page.waitForEvent("filechooser");
      await left.locator("button", { hasText: "Choose the file again" }).press("Enter");
      await (await chooser).setFiles(file);
    };
    await choose(join(files, "other.bin"));
    await page.locator(".toast", { hasText: "not the file “left.bin”" }).waitFor();
    await choose(join(files, "film.bin"));
    await wentWell(page, "1 file uploaded");
    assert.deepEqual(offsets, [String(5 * MIB)]);
    arrived("left.bin");
    const dropped = cardOf(page, "“dropped.bin”");
    await dropped.locator("button", { hasText: "Discard" }).click();
    await dropped.waitFor({ state: "detached" });
    const items = await unfinished(request);
    assert.deepEqual(items.filter(({ path }) => path.startsWith("/projects/resume/")), []);
  }));
