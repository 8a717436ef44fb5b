// Logging in: a page of its own at the start, a question over everything when a session ended in the middle of work. It
// is a conversation: the machine may ask for more than a password.

import { ApiError, PROGRAMS, encodeParams, readReply, sendOnce } from "./api.js";
import { $, h, icon } from "./dom.js";
import { describe } from "./errors.js";
import { formatDuration } from "./format.js";
import "./later.js";
import { t } from "./strings.js";

// What machines commonly ask, in the language of the page. Anything else is shown as it was asked.
const QUESTIONS = [
  [/^(current|\(current\)).*password/i, "login.ask.current", "current-password"],
  [/^(new|enter new).*password/i, "login.ask.new", "new-password"],
  [/^(retype|repeat|confirm).*password/i, "login.ask.again", "new-password"],
  [/^password:?\s*$/i, "login.password", "current-password"],
  [/code|token|otp/i, null, "one-time-code"],
];

async function say(params) {
  const response = await sendOnce(PROGRAMS + "login", { method: "POST", body: encodeParams(params) });
  return readReply(response.status, await response.text());
}

// The form. `user` is the only one who can log in here, "" for anybody; onDone(user) as the machine has the name.
class LogIn {
  constructor({ user, onDone, others = [] }) {
    Object.assign(this, { user, onDone, others });
    this.said = h("p.complaint", { role: "alert" });
    this.form = h("form.login-form", { onsubmit: (event) => this.submit(event), method: "post" });
    this.begin();
  }

  begin() {
    this.asked = null;
    this.name = h("input.input", {
      name: "user",
      type: "text",
      value: this.user,
      readonly: this.user !== "",
      autocomplete: "username",
      autocapitalize: "none",
      spellcheck: "false",
      required: true,
      maxlength: 255,
    });
    this.answer = h("input.input", { name: "password", type: "password", autocomplete: "current-password", maxlength: 4096 });
    this.show([field(t("login.name"), this.name), field(t("login.password"), this.answer)], t("login.action"), this.others);
    (this.user === "" ? this.name : this.answer).focus();
  }

  // Another question: {text, hidden, messages}
  ask({ text, hidden, messages = [] }) {
    const [, key, purpose] = QUESTIONS.find(([fits]) => fits.test(text)) ?? [null, null, hidden ? "current-password" : "off"];
    this.asked = { hidden };
    this.answer = h("input.input", {
      name: "answer",
      type: hidden && purpose !== "one-time-code" ? "password" : "text",
      autocomplete: purpose,
      spellcheck: "false",
      autocapitalize: "none",
      maxlength: 4096,
    });
    const back = h("button.button", { type: "button", onclick: () => this.cancel() }, t("dialog.cancel"));
    const heard = messages.filter((one) => one.trim() !== "").map((one) => h("p.login-message", { role: "status" }, one));
    this.show([...heard, field(key ? t(key) : text.replace(/:\s*$/, ""), this.answer)], t("login.next"), [back]);
    this.answer.focus();
  }

  show(fields, action, beside) {
    this.button = h("button.button.primary", { type: "submit" }, action);
    this.form.replaceChildren(...fields, this.said, h("footer", {}, beside, this.button));
  }

  cancel() {
    say({ action: "cancel" }).catch(() => {});
    this.said.textContent = "";
    this.begin();
  }

  async submit(event) {
    event.preventDefault();
    if (this.button.disabled) return;
    const text = this.answer.value;
    this.busy(true);
    try {
      // Whoever leaves the password empty is asked by the machine itself, in its own words.
      const begin = { action: "begin", user: this.name.value, password: text || undefined };
      const reply = await say(this.asked ? { action: "answer", text } : begin);
      this.said.textContent = "";
      if (reply.step === "done") this.onDone(reply.user);
      else this.ask(reply);
    } catch (failure) {
      this.fail(failure);
    }
  }

  busy(now) {
    this.button.disabled = now;
    this.form.setAttribute("aria-busy", String(now));
  }

  // Every refusal but that of a second answer ends the conversation.
  fail(failure) {
    const typed = this.name.value;
    if (this.asked) this.begin();
    else this.busy(false);
    this.name.value = typed;
    this.said.textContent = wordsOf(failure);
    this.answer.value = "";
    this.answer.focus();
  }
}

function wordsOf(failure) {
  const { title, hint } = describe(failure instanceof ApiError ? failure : {});
  const wait = failure.data?.wait > 0 ? t("login.wait", { time: formatDuration(failure.data.wait) }) : "";
  return [title, hint, wait].filter(Boolean).join(". ").replaceAll("..", ".");
}

function field(label, input) {
  return h("label.field", {}, h("span", {}, label), input);
}

// Resolves with the name of who logged in.
export function logInPage(machine) {
  return new Promise((resolve) => {
    const logo = icon("logo", "login-logo");
    const page = h("main.login");
    const form = new LogIn({
      user: "",
      onDone: (user) => {
        page.remove();
        $("app").hidden = false;
        resolve(user);
      },
    });
    $("app").hidden = true;
    page.append(h("section.login-card", {}, logo, h("h1", {}, machine ? t("login.title", { machine }) : t("login.title.plain")), form.form));
    document.body.append(page);
    form.name.focus();
  });
}

// `user` again, without leaving what is on screen. Nothing else can be done meanwhile.
export function logInHere(user, startAnew) {
  return new Promise((resolve) => {
    const node = h("dialog.dialog.login-again", { "aria-labelledby": "login-again" });
    const other = h("button.button", { type: "button", onclick: startAnew }, t("login.other"));
    const { form, answer } = new LogIn({ user, onDone: resolve, others: [other] });
    node.append(h("header", {}, h("h2#login-again", {}, t("login.again"))), h("p", {}, t("login.again.hint")), form);
    node.addEventListener("cancel", (event) => event.preventDefault());
    // Escape a second time closes whatever a page says.
    node.addEventListener("close", () => node.remove());
    node.addEventListener("keydown", (event) => {
      if (event.key === "Escape") event.preventDefault();
      event.stopPropagation();
    });
    document.body.append(node);
    node.showModal();
    answer.focus();
  });
}
