// What is asked of the program.

const { program, receiver, pageSize } = window.visitorDefinitions;
const link = new URLSearchParams(location.search).get("FOLDER_SHARING");

export function address(fields) {
  const query = new URLSearchParams(fields);
  if (link !== null) query.set("FOLDER_SHARING", link);
  return `${window.g_Tunnel}${program}?${query}`;
}

// A path goes as its bytes, which need not be text.
export function pathField({ path, path_raw: raw }) {
  if (raw !== undefined) return { path_raw: raw };
  return path ? { path } : {};
}

export function fileAddress(item) {
  return address({ action: "download", ...pathField(item) });
}

// What the page itself shows of a file.
export function lookAddress(item) {
  return address({ action: "download", look: 1, ...pathField(item) });
}

// Where a link is good for so many downloads, whoever sees a file has it: then nothing is shown but names.
export const limits = { left: null };

async function ask(fields, options) {
  const answer = await fetch(address(fields), { credentials: "same-origin", ...options });
  return { status: answer.status, json: await answer.json() };
}

// Without a reply there is nothing to tell apart.
const FAILED = { status: 500, json: { success: false } };

export async function state() {
  const answer = await ask({ action: "state" }).catch(() => FAILED);
  limits.left = answer.json.data?.downloads_left ?? null;
  return answer;
}

export function list(path, offset, { by, direction }) {
  const shown = { additional: "size,time,icon", limit: pageSize, offset, sort_by: by, sort_direction: direction };
  return ask({ action: "list", ...shown, ...pathField(path) }).catch(() => FAILED);
}

// Passwords are judged in turn: whoever is not next is told when to come again, and with which turn.
export async function logIn(password, tellWait) {
  let turn = "";
  for (;;) {
    const body = new URLSearchParams({ action: "login", password, turn });
    const answer = await ask({}, { method: "POST", body }).catch(() => FAILED);
    if (answer.status !== 429) return answer;
    turn = answer.json.data.turn;
    await wait(answer.json.data.wait, tellWait);
  }
}

// One file to whoever made the link. Resolves with what was answered, status 0 when nothing was.
export function sendFile(file, signal, onProgress) {
  return new Promise((resolve) => {
    const request = new XMLHttpRequest();
    const query = new URLSearchParams({ name: file.name.toWellFormed() });
    if (link !== null) query.set("FOLDER_SHARING", link);
    const done = () => {
      let code = 0;
      try {
        code = JSON.parse(request.responseText).error?.code ?? 0;
      } catch {
        // The status alone says what happened.
      }
      resolve({ status: request.status, code });
    };
    for (const type of ["load", "error", "abort"]) request.addEventListener(type, done);
    request.upload.addEventListener("progress", (event) => event.lengthComputable && onProgress(event.loaded / event.total));
    signal.addEventListener("abort", () => request.abort());
    request.open("POST", `${window.g_Tunnel}${receiver}?${query}`);
    request.setRequestHeader("Content-Type", "application/octet-stream");
    request.send(file);
  });
}

async function wait(milliseconds, tell) {
  const end = Date.now() + milliseconds;
  for (let left = milliseconds; left > 0; left = end - Date.now()) {
    if (milliseconds > 1500) tell(Math.ceil(left / 1000));
    await new Promise((done) => setTimeout(done, Math.min(left, 1000)));
  }
}
