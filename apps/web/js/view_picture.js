// Pictures closer, and turned: by wheel, two fingers, keys and buttons. A swipe leads to the next one, and so does time.

import { h, iconButton } from "./dom.js";
import { slideTools } from "./slideshow.js";
import { t } from "./strings.js";

const STEP = 1.5;
const MOST = 16;
const SWIPE = 60; // CSS pixels

// Buttons for the image, which they and the stage's own events change as long as `signal` lives. `step(by)` is the way
// to the next one, `next()` that to the next picture.
export function pictureTools(stage, image, signal, { step, next }) {
  const state = { zoom: 1, x: 0, y: 0, turn: 0 };
  const points = new Map();
  let before = null;

  const apply = () => {
    const turned = state.turn % 180 !== 0;
    // Turned by a quarter it has to fit the other way.
    const fit = turned ? Math.min(1, stage.clientWidth / image.offsetHeight, stage.clientHeight / image.offsetWidth) : 1;
    if (state.zoom === 1) Object.assign(state, { x: 0, y: 0 });
    image.style.transform = `translate(${state.x}px, ${state.y}px) rotate(${state.turn}deg) scale(${state.zoom * fit})`;
    image.classList.toggle("zoomed", state.zoom > 1);
  };
  // What lies below the point stays there.
  const zoomTo = (zoom, { clientX, clientY } = middleOf(stage)) => {
    const to = Math.min(MOST, Math.max(1, zoom));
    const { left, top, width, height } = stage.getBoundingClientRect();
    const [dx, dy] = [clientX - left - width / 2 - state.x, clientY - top - height / 2 - state.y];
    state.x -= dx * (to / state.zoom - 1);
    state.y -= dy * (to / state.zoom - 1);
    state.zoom = to;
    apply();
  };
  const slides = slideTools(stage.parentElement, next, signal);
  const turn = () => {
    state.turn += 90;
    apply();
  };
  const on = (type, run, options = {}) => stage.addEventListener(type, run, { signal, ...options });

  on(
    "wheel",
    (event) => {
      event.preventDefault();
      zoomTo(state.zoom * Math.exp(-event.deltaY / 300), event);
    },
    { passive: false },
  );
  on("dblclick", (event) => zoomTo(state.zoom > 1 ? 1 : 2.5, event));
  on("pointerdown", (event) => {
    if (event.target.closest("button")) return;
    points.set(event.pointerId, event);
    before = { ...state, at: event, gap: gapOf(points) };
    if (event.target === image) image.setPointerCapture(event.pointerId);
  });
  on("pointermove", (event) => {
    if (!points.has(event.pointerId) || !before) return;
    points.set(event.pointerId, event);
    if (points.size === 2 && before.gap > 0) {
      const [a, b] = [...points.values()];
      return zoomTo((before.zoom * gapOf(points)) / before.gap, { clientX: (a.clientX + b.clientX) / 2, clientY: (a.clientY + b.clientY) / 2 });
    }
    if (state.zoom === 1 || points.size !== 1) return;
    state.x = before.x + event.clientX - before.at.clientX;
    state.y = before.y + event.clientY - before.at.clientY;
    apply();
  });
  const end = (event) => {
    const alone = points.size === 1 && points.delete(event.pointerId);
    points.delete(event.pointerId);
    if (!before) return;
    const [dx, dy] = [event.clientX - before.at.clientX, event.clientY - before.at.clientY];
    const swiped = alone && event.type === "pointerup" && event.pointerType === "touch" && state.zoom === 1 && before.zoom === 1;
    before = points.size > 0 ? { ...state, at: [...points.values()][0], gap: gapOf(points) } : null;
    if (swiped && Math.abs(dx) > SWIPE && Math.abs(dx) > 2 * Math.abs(dy)) step(dx < 0 ? 1 : -1);
  };
  on("pointerup", end);
  on("pointercancel", end);
  stage.parentElement.addEventListener(
    "keydown",
    (event) => {
      if (event.ctrlKey || event.metaKey || event.altKey) return;
      const does = { "+": () => zoomTo(state.zoom * STEP), "=": () => zoomTo(state.zoom * STEP), "-": () => zoomTo(state.zoom / STEP), 0: () => zoomTo(1), r: turn, s: slides.toggle };
      if (!does[event.key]) return;
      event.preventDefault();
      does[event.key]();
    },
    { signal },
  );
  return h(
    "div.preview-tools",
    {},
    iconButton("zoom-out", t("view.zoom_out"), () => zoomTo(state.zoom / STEP)),
    iconButton("zoom-in", t("view.zoom_in"), () => zoomTo(state.zoom * STEP)),
    iconButton("turn", t("view.turn"), turn),
    slides.box,
  );
}

function middleOf(stage) {
  const { left, top, width, height } = stage.getBoundingClientRect();
  return { clientX: left + width / 2, clientY: top + height / 2 };
}

function gapOf(points) {
  if (points.size !== 2) return 0;
  const [a, b] = [...points.values()];
  return Math.hypot(a.clientX - b.clientX, a.clientY - b.clientY);
}
