// PDF by pdf.js: pages are drawn when they come into sight, scripts in the document never run.

import { headersOf, urlOf } from "./api.js";
import { askText } from "./dialogs.js";
import { h, iconButton, loadStyle } from "./dom.js";
import "./later.js";
import { t } from "./strings.js";

const MOST_PIXELS = 16e6; // of one page
const AHEAD = "600px";
const ZOOMS = [0.25, 0.5, 0.75, 1, 1.25, 1.5, 2, 3, 4];

const third = (path) => new URL(`../third/pdf/${path}`, import.meta.url).href;

// The node of a document. Throws what is wrong with it.
export async function pdfNode(entry, signal) {
  loadStyle("documents");
  const pdfjs = await import("../third/pdf/pdf.js");
  pdfjs.GlobalWorkerOptions.workerSrc = third("worker.js");
  const task = pdfjs.getDocument({
    url: new URL(urlOf("download", { path_raw: entry.id }), location.href).href,
    httpHeaders: headersOf(),
    cMapUrl: third("cmaps/"),
    cMapPacked: true,
    wasmUrl: third("decoders/"),
    useWasm: false,
    isEvalSupported: false,
    enableXfa: false,
    useSystemFonts: true,
    disableAutoFetch: true,
    rangeChunkSize: 256 * 1024,
    maxImageSize: 64e6,
    verbosity: 0,
  });
  task.onPassword = async (use, reason) => {
    const password = await askText({
      title: t("pdf.password"),
      label: t(reason === 2 ? "pdf.password.wrong" : "pdf.password.label"),
      type: "password",
      action: t("pdf.password.open"),
      submit: async () => undefined,
    });
    if (password === null) task.destroy();
    else use(password);
  };
  signal.addEventListener("abort", () => task.destroy());
  const document = await task.promise;
  return new Pages(pdfjs, document, await document.getPage(1), signal).node;
}

class Pages {
  constructor(pdfjs, document, first, signal) {
    Object.assign(this, { pdfjs, document, zoom: 1 });
    const { width, height } = first.getViewport({ scale: 1 });
    this.size = { width, height };
    this.list = h("div.pdf-pages.scrolls", { tabindex: 0, role: "group", "aria-label": t("pdf.pages") });
    this.where = h("span", { role: "status" });
    this.node = h(
      "div.pdf",
      {},
      this.list,
      h(
        "div.preview-tools",
        {},
        iconButton("zoom-out", t("view.zoom_out"), () => this.step(-1)),
        iconButton("zoom-in", t("view.zoom_in"), () => this.step(1)),
        this.where,
      ),
    );
    this.pages = Array.from({ length: document.numPages }, (_, i) => {
      const node = h("div.pdf-page", { "data-page": i + 1, role: "img", "aria-label": t("pdf.page", { number: i + 1, count: document.numPages }) });
      return { node, number: i + 1, size: this.size, drawn: null };
    });
    this.list.append(...this.pages.map(({ node }) => node));
    this.watch = new IntersectionObserver((seen) => this.sight(seen), { root: this.list, rootMargin: AHEAD });
    for (const page of this.pages) this.watch.observe(page.node);
    this.list.addEventListener("scroll", () => this.say());
    this.list.addEventListener("keydown", (event) => {
      if (event.ctrlKey || event.metaKey || !["+", "-", "="].includes(event.key)) return;
      event.preventDefault();
      this.step(event.key === "-" ? -1 : 1);
    });
    const resized = new ResizeObserver(() => this.fit());
    resized.observe(this.list);
    signal.addEventListener("abort", () => {
      resized.disconnect();
      this.watch.disconnect();
    });
    this.fit();
  }

  // Pages are as wide as the place for them, times the zoom.
  fit() {
    const room = Math.min(1000, Math.max(200, this.list.clientWidth - 24));
    this.width = room * this.zoom;
    for (const page of this.pages) this.shape(page);
    for (const page of this.pages.filter(({ drawn }) => drawn)) this.draw(page);
    this.say();
  }

  shape({ node, size }) {
    node.style.width = `${this.width}px`;
    node.style.height = `${(this.width * size.height) / size.width}px`;
  }

  step(by) {
    const at = ZOOMS.findIndex((zoom) => zoom >= this.zoom);
    const { scrollTop, scrollHeight } = this.list;
    this.zoom = ZOOMS[Math.max(0, Math.min(ZOOMS.length - 1, at + by))];
    this.fit();
    this.list.scrollTop = (scrollTop / scrollHeight) * this.list.scrollHeight;
  }

  say() {
    const middle = this.list.scrollTop + this.list.clientHeight / 2;
    const page = this.pages.findLast(({ node }) => node.offsetTop - this.list.offsetTop <= middle) ?? this.pages[0];
    this.where.textContent = t("pdf.page", { number: page.number, count: this.pages.length });
  }

  sight(seen) {
    for (const { target, isIntersecting } of seen) {
      const page = this.pages[Number(target.dataset.page) - 1];
      if (isIntersecting && !page.drawn) this.draw(page);
      if (!isIntersecting && page.drawn) {
        page.drawn.cancel?.();
        page.drawn = null;
        page.node.replaceChildren();
      }
    }
  }

  async draw(page) {
    page.drawn?.cancel?.();
    const mine = (page.drawn = {});
    try {
      const found = await this.document.getPage(page.number);
      if (page.drawn !== mine) return;
      const { width, height } = found.getViewport({ scale: 1 });
      page.size = { width, height };
      this.shape(page);
      const scale = this.width / width;
      const sharp = Math.min(devicePixelRatio, Math.sqrt(MOST_PIXELS / (width * height)) / scale);
      const viewport = found.getViewport({ scale: scale * sharp });
      const canvas = h("canvas", { width: Math.floor(viewport.width), height: Math.floor(viewport.height) });
      const drawing = found.render({ canvas, viewport });
      mine.cancel = () => drawing.cancel();
      await drawing.promise;
      if (page.drawn !== mine) return;
      const layer = h("div.pdf-text");
      layer.style.setProperty("--total-scale-factor", String(scale));
      page.node.replaceChildren(canvas, layer);
      const text = new this.pdfjs.TextLayer({ textContentSource: found.streamTextContent(), container: layer, viewport: found.getViewport({ scale }) });
      await text.render();
      page.node.setAttribute("role", "group");
    } catch (failure) {
      if (page.drawn === mine && failure.name !== "RenderingCancelledException") page.node.replaceChildren(h("p.soft", {}, t("preview.broken")));
    }
  }
}
