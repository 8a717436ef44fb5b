// The address of a public link as a QR code, to be shown to a camera, kept or printed.

import { dialog } from "./dialogs.js";
import { h, icon } from "./dom.js";
import "./later.js";
import { t } from "./strings.js";

const SVG = "http://www.w3.org/2000/svg";
const QUIET = 4; // modules of light ground on each side, without which cameras find nothing
const PIXELS = 10; // of a module in the picture that is kept

async function matrixOf(text) {
  const { qrcode } = await import("../third/qr.js");
  const code = qrcode(0, "M");
  code.addData(text);
  code.make();
  const size = code.getModuleCount();
  return { size, isDark: (x, y) => code.isDark(y, x) };
}

function pathOf({ size, isDark }) {
  let path = "";
  for (let y = 0; y < size; ++y) {
    for (let x = 0; x < size; ++x) if (isDark(x, y)) path += `M${x + QUIET} ${y + QUIET}h1v1h-1z`;
  }
  return path;
}

// Dark on light, whatever the page's colours are.
function drawingOf(matrix, label) {
  const edge = matrix.size + 2 * QUIET;
  const make = (tag, attributes) => {
    const node = document.createElementNS(SVG, tag);
    for (const [name, value] of Object.entries(attributes)) node.setAttribute(name, value);
    return node;
  };
  const svg = make("svg", { viewBox: `0 0 ${edge} ${edge}`, role: "img", "aria-label": label, class: "code" });
  svg.append(
    make("rect", { width: edge, height: edge, fill: "#ffffff" }),
    make("path", { d: pathOf(matrix), fill: "#000000", "shape-rendering": "crispEdges" }),
  );
  return svg;
}

function keep(matrix, name) {
  const edge = (matrix.size + 2 * QUIET) * PIXELS;
  const canvas = h("canvas", { width: edge, height: edge });
  const brush = canvas.getContext("2d");
  brush.fillStyle = "#ffffff";
  brush.fillRect(0, 0, edge, edge);
  brush.fillStyle = "#000000";
  brush.scale(PIXELS, PIXELS);
  brush.fill(new Path2D(pathOf(matrix)));
  canvas.toBlob((blob) => {
    const href = URL.createObjectURL(blob);
    h("a", { href, download: `${name}.png` }).click();
    setTimeout(() => URL.revokeObjectURL(href), 60_000);
  });
}

export async function showCode(address, name) {
  const matrix = await matrixOf(address);
  return dialog({
    title: t("link.code"),
    className: "link-code",
    fill: () => [
      h(
        "div.body",
        {},
        drawingOf(matrix, t("link.code.alt", { address })),
        h("p.code-name", {}, h("bdi", {}, name)),
        h("p.soft.code-address", {}, address),
      ),
      h(
        "footer",
        {},
        h("button.button.outlined", { type: "button", onclick: () => print() }, icon("print"), t("link.code.print")),
        h(
          "button.button.primary",
          { type: "button", onclick: () => keep(matrix, t("link.code.file")) },
          icon("download"),
          t("link.code.keep"),
        ),
      ),
    ],
  });
}
