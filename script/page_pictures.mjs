// Pictures of the main states at three widths, light and dark, in both languages, for looking at.
//   ORVEL_TEST_SCREENSHOTS=FOLDER tests/web/run.sh $PWD/script/server $PWD/build/dev $PWD/script/page_pictures.mjs
// ORVEL_TEST_ONLY: "390 dark de" makes those alone.
import { test } from "node:test";
import { rowsReady, screenshot, withPage } from "../tests/web/browser.mjs";
import { visitStates } from "../tests/web/main_states.mjs";

const WIDTHS = { 1440: 900, 820: 1100, 390: 780 };

for (const [width, height] of Object.entries(WIDTHS))
  for (const colorScheme of ["light", "dark"])
    for (const language of ["en", "de"]) {
      const which = `${width} ${colorScheme} ${language}`;
      if (process.env.ORVEL_TEST_ONLY && !process.env.ORVEL_TEST_ONLY.split(",").includes(which)) continue;
      const look = { viewport: { width: Number(width), height }, hasTouch: width < 600, isMobile: width < 600, colorScheme, locale: language === "en" ? "en-GB" : "de-DE" };
      test(which, { timeout: 300_000 }, () =>
        withPage("alice", { path: "/", ...look }, async (page) => {
          await visitStates(page, async (_, state, part = "html") => {
            await rowsReady(page);
            await page.waitForSelector(part);
            await screenshot(page, `${which} ${state}`);
          });
        }));
    }
