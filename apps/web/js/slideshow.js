// The pictures of a list one after the other. It stops where nobody looks.

import { h, iconButton } from "./dom.js";
import { pref, setPref } from "./prefs.js";
import { t } from "./strings.js";

const SECONDS = [3, 5, 10, 30];
let running = false;
let awake = null; // keeps the screen on, where the browser can
let timer = null;
let paint = () => {};

document.addEventListener("visibilitychange", () => document.hidden && stop());

function seconds() {
  return SECONDS.includes(pref("slides", 0)) ? pref("slides", 0) : 5;
}

// {nodes, toggle} for the picture on screen; `next()` is the way to the next one, and the picture goes with `signal`.
export function slideTools(dialog, next, signal) {
  const choice = h("select.input.slides", { "aria-label": t("slides.each") });
  choice.append(...SECONDS.map((count) => h("option", { value: count, selected: count === seconds() }, t("slides.seconds", { count }))));
  const box = h("span.slides-box");
  const toggle = () => {
    if (running) stop();
    else begin(dialog);
    arm(next, signal);
  };
  choice.addEventListener("change", () => {
    setPref("slides", Number(choice.value));
    arm(next, signal);
  });
  const button = iconButton("play", "", toggle, { "data-slides": "" });
  box.append(button, choice);
  paint = () => {
    const label = t(running ? "slides.stop" : "slides.start");
    button.setAttribute("aria-label", label);
    button.title = `${label} (S)`;
    button.querySelector("use").setAttribute("href", running ? "#i-stop" : "#i-play");
    choice.hidden = !running;
  };
  paint();
  arm(next, signal);
  return { box, toggle };
}

// What cannot be shown is passed over like a picture.
export function arm(next, signal) {
  clearTimeout(timer);
  if (!running) return;
  const mine = setTimeout(next, seconds() * 1000);
  timer = mine;
  signal.addEventListener("abort", () => clearTimeout(mine), { once: true });
}

function begin(dialog) {
  running = true;
  dialog.addEventListener("close", stop, { once: true });
  // Without a secure connection there is none.
  navigator.wakeLock?.request("screen").then(
    (lock) => {
      if (running && !awake) awake = lock;
      else lock.release();
    },
    () => {},
  );
  paint();
}

function stop() {
  running = false;
  clearTimeout(timer);
  awake?.release();
  awake = null;
  paint();
}
