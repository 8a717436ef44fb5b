// Draws the icons that programs name, apps/web/images, from the page's own: one picture a kind, and for each extension
// a link to that of its kind. To be run by hand when icons.svg or the kinds of js/icons.js change:
//   node script/draw_icons.mjs
import { mkdirSync, readFileSync, rmSync, symlinkSync } from "node:fs";
import { chromium } from "../tests/web/node_modules/playwright-core/index.mjs";
import { KINDS, PICTURES } from "../apps/web/js/icons.js";

const web = new URL("../apps/web/", import.meta.url);
const images = new URL("images/", web);
rmSync(images, { recursive: true, force: true });
for (const folder of ["kinds", "files_ext"]) mkdirSync(new URL(folder, images), { recursive: true });

const browser = await chromium.launch({ executablePath: "/usr/bin/chromium", args: ["--no-sandbox"] });
const page = await browser.newPage({ viewport: { width: 96, height: 96 } });
const look = readFileSync(new URL("css/base.css", web), "utf8");
for (const kind of [...Object.keys(KINDS), ...Object.values(PICTURES)]) {
  await page.setContent(
    `<style>${look} html, body { margin: 0; background: transparent } .drawn { width: 96px; height: 96px }</style>
    ${readFileSync(new URL("icons.svg", web), "utf8")}<svg class="drawn"><use href="#i-kind-${kind}"/></svg>`,
  );
  await page.locator(".drawn").screenshot({ path: new URL(`kinds/${kind}.png`, images).pathname, omitBackground: true });
}
await browser.close();

for (const [kind, extensions] of Object.entries(KINDS)) {
  for (const extension of extensions.split(" "))
    symlinkSync(`../kinds/${kind}.png`, new URL(`files_ext/${extension}.png`, images));
}
for (const [icon, kind] of Object.entries(PICTURES)) symlinkSync(`kinds/${kind}.png`, new URL(icon, images));
