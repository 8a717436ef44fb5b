// Debian's Firefox over WebDriver BiDi: as much of it as the tests need.
import { spawn } from "node:child_process";
import { existsSync, mkdtempSync, rmSync, writeFileSync } from "node:fs";
import { tmpdir } from "node:os";
import { join } from "node:path";
import { createInterface } from "node:readline";
import { setTimeout } from "node:timers/promises";
import { LONGEST, until } from "./support.mjs";

const PROGRAM = process.env.ORVEL_TEST_FIREFOX ?? "/usr/bin/firefox-esr";
const KEYS = { Enter: "\uE007", Escape: "\uE00C", Delete: "\uE017", F2: "\uE032" };

// The first of what `selector` finds that is in sight and holds `text`.
const FIND = `(selector, text) => [...document.querySelectorAll(selector)].find((one) =>
  one.checkVisibility() && (one.textContent + (one.getAttribute("aria-label") ?? "")).includes(text)) ?? null`;

export class Firefox {
  static async start() {
    if (!existsSync(PROGRAM)) throw new Error(`${PROGRAM} is not installed: script/bootstrap does that`);
    const profile = mkdtempSync(join(tmpdir(), "orvel-firefox-"));
    const program = spawn(PROGRAM, ["--headless", "--profile", profile, "--remote-debugging-port", "0"], {
      env: { ...process.env, HOME: profile },
      stdio: ["ignore", "ignore", "pipe"],
    });
    const firefox = new Firefox(program, profile);
    try {
      const address = await within("Firefox's address", firefox.address(program.stderr));
      firefox.socket = new WebSocket(`${address}/session`);
      firefox.socket.onmessage = ({ data }) => firefox.told(JSON.parse(data));
      await within("Firefox", new Promise((resolve) => (firefox.socket.onopen = resolve)));
      await firefox.send("session.new", { capabilities: { alwaysMatch: { unhandledPromptBehavior: { file: "ignore", default: "dismiss" } } } });
      await firefox.send("session.subscribe", { events: ["log.entryAdded", "network.responseCompleted", "input.fileDialogOpened", "network.beforeRequestSent"] });
      return firefox;
    } catch (failure) {
      await firefox.close();
      throw failure;
    }
  }

  constructor(program, profile) {
    Object.assign(this, { program, profile, sent: 0, waiting: new Map(), complaints: [], chooser: null });
    this.ended = new Promise((resolve) => program.once("exit", resolve));
  }

  async address(output) {
    for await (const line of createInterface(output)) {
      const [, address] = /WebDriver BiDi listening on (ws:\S+)/.exec(line) ?? [];
      if (address) return output.resume() && address;
    }
    throw new Error("Firefox ended before it said where it listens");
  }

  told({ id, type, result, error, message, method, params }) {
    if (type === "event") return this.happened(method, params);
    const { resolve, reject } = this.waiting.get(id);
    this.waiting.delete(id);
    return type === "success" ? resolve(result) : reject(new Error(`${error}: ${message}`));
  }

  happened(method, params) {
    if (method === "input.fileDialogOpened") this.chooser?.(params.element);
    else if (method === "network.beforeRequestSent") {
      if (params.isBlocked) this.held(params.request.request);
    } else if (method === "network.responseCompleted") {
      const { status, url } = params.response;
      const { pathname } = new URL(url);
      const noPicture = pathname === "/cgi-bin/thumbnail" && [415, 503].includes(status); // see browser.mjs
      if (status >= 400 && !noPicture) this.complaints.push(`status ${status}: ${pathname}`);
    } else if (params.level === "error" || params.level === "warn") this.complaints.push(`${params.level}: ${params.text}`);
  }

  send(method, params) {
    const id = ++this.sent;
    this.socket.send(JSON.stringify({ id, method, params }));
    return within(method, new Promise((resolve, reject) => this.waiting.set(id, { resolve, reject })));
  }

  // Does `act` while the next request of that path is about to be sent.
  async holdOnce(pathname, act) {
    const { protocol, hostname, port } = new URL((await this.call("() => location.href")).value);
    const pattern = { type: "pattern", protocol: protocol.slice(0, -1), hostname, port, pathname };
    const request = new Promise((resolve) => (this.held = resolve));
    const { intercept } = await this.send("network.addIntercept", { phases: ["beforeRequestSent"], urlPatterns: [pattern] });
    const held = await within(pathname, request);
    await act();
    await this.send("network.removeIntercept", { intercept });
    await this.send("network.continueRequest", { request: held });
  }

  // A page of its own, without what others keep.
  async open(url) {
    const { userContext } = await this.send("browser.createUserContext", {});
    ({ context: this.context } = await this.send("browsingContext.create", { type: "tab", userContext }));
    await this.send("browsingContext.setViewport", { context: this.context, viewport: { width: 1280, height: 800 } });
    await this.goto(url);
  }

  goto(url) {
    return this.send("browsingContext.navigate", { context: this.context, url, wait: "interactive" });
  }

  async call(code, ...values) {
    const said = await this.send("script.callFunction", {
      functionDeclaration: code,
      arguments: values.map((value) => ({ type: typeof value, value })),
      target: { context: this.context },
      awaitPromise: true,
    });
    if (said.type === "exception") throw new Error(said.exceptionDetails.text);
    return said.result;
  }

  // Waits until it is there and in sight.
  find(selector, text = "") {
    return this.look(`${selector} “${text}”`, async () => {
      const { sharedId } = await this.call(FIND, selector, text);
      return sharedId && { sharedId };
    });
  }

  gone(selector, text = "") {
    return this.look(`the end of ${selector} “${text}”`, async () => (await this.call(FIND, selector, text)).type === "null");
  }

  async look(what, run) {
    try {
      return await until(what, run);
    } catch (failure) {
      await this.screenshot("failed-firefox");
      failure.stack += `\nShown: ${(await this.call("() => location.hash + '\\n' + document.body.innerText")).value.slice(0, 2000)}`;
      throw failure;
    }
  }

  async screenshot(name) {
    const folder = process.env.ORVEL_TEST_SCREENSHOTS;
    if (!folder) return;
    const { data } = await this.send("browsingContext.captureScreenshot", { context: this.context });
    writeFileSync(join(folder, `${name}.png`), Buffer.from(data, "base64"));
  }

  // What is drawn anew between finding and clicking is found again.
  async click(selector, text, count = 1) {
    const clicks = Array.from({ length: count }, () => [{ type: "pointerDown", button: 0 }, { type: "pointerUp", button: 0 }]);
    return until(`a click on ${selector} “${text}”`, async () => {
      const origin = { type: "element", element: await this.find(selector, text) };
      const actions = [{ type: "pointerMove", x: 0, y: 0, origin }, ...clicks.flat()];
      try {
        return await this.send("input.performActions", { context: this.context, actions: [{ type: "pointer", id: "mouse", actions }] });
      } catch (failure) {
        if (!/^(move target out of bounds|no such element|stale element reference)/.test(failure.message)) throw failure;
        return null;
      }
    });
  }

  // A key by name, or characters.
  async type(text) {
    const actions = (text in KEYS ? [KEYS[text]] : [...text]).flatMap((value) => [{ type: "keyDown", value }, { type: "keyUp", value }]);
    await this.send("input.performActions", { context: this.context, actions: [{ type: "key", id: "keys", actions }] });
  }

  async fill(selector, text) {
    await this.find(selector);
    await this.call("(selector) => { const field = document.querySelector(selector); field.focus(); field.select(); }", selector);
    await this.type(text);
  }

  // What the dialog that `act` opens is answered with.
  async choose(files, act) {
    const opened = new Promise((resolve) => (this.chooser = resolve));
    await act();
    const element = await within("a dialog for files", opened);
    await this.send("input.setFiles", { context: this.context, element: { sharedId: element.sharedId }, files });
  }

  async close() {
    this.socket?.close();
    this.program.kill();
    await this.ended;
    rmSync(this.profile, { recursive: true, force: true, maxRetries: 5 });
  }
}

async function within(what, promise) {
  const over = new AbortController();
  const late = setTimeout(LONGEST, null, { signal: over.signal }).then(() => {
    throw new Error(`waited in vain for ${what}`);
  });
  late.catch(() => {});
  return Promise.race([promise, late]).finally(() => over.abort());
}
