// Choices: light or dark, language; and the list of shortcuts.

import { addCommand, allCommands, keysOf, shortcutText } from "./commands.js";
import { dialog } from "./dialogs.js";
import { $, h } from "./dom.js";
import { openMenu } from "./menu.js";
import { pref, setPref } from "./prefs.js";
import { changeLanguage, language, LANGUAGES, t } from "./strings.js";

const THEMES = ["system", "light", "dark"];
const GROUPS = ["go", "open", "select", "change", "new", "view", "info"];

addCommand({ id: "help", icon: "help", keys: ["?", "F1"], group: "info", run: showHelp });
addCommand({
  id: "find",
  icon: "filter",
  keys: ["/", "Mod+f"],
  group: "go",
  when: ({ folder }) => folder,
  run: () => {
    document.querySelector(".top").classList.add("finding");
    $("find").focus();
    $("find").select();
  },
});

function applyTheme() {
  const theme = pref("theme", "system");
  if (theme === "system") document.documentElement.removeAttribute("data-theme");
  else document.documentElement.dataset.theme = theme;
}

function setTheme(theme) {
  setPref("theme", theme);
  applyTheme();
}

export function setupSettings() {
  applyTheme();
  const button = $("settings-button");
  button.addEventListener("click", () =>
    openMenu(
      [
        { heading: t("settings.colours") },
        ...THEMES.map((theme) => ({
          label: t(`theme.${theme}`),
          checked: pref("theme", "system") === theme,
          run: () => setTheme(theme),
        })),
        { heading: t("settings.language") },
        ...Object.entries(LANGUAGES).map(([tag, name]) => ({
          label: name,
          checked: tag === language,
          run: () => changeLanguage(tag),
        })),
        "-",
        { label: t("command.help"), icon: "help", shortcut: "?", run: showHelp },
      ],
      { anchor: button },
    ),
  );
  // A filter that holds stays in sight, with what clears it.
  $("find").addEventListener("blur", () => {
    if ($("find").value === "") document.querySelector(".top").classList.remove("finding");
  });
}

function showHelp() {
  const marksOf = (command) => keysOf(command).map((keys) => h("kbd", {}, shortcutText(keys)));
  const sections = GROUPS.map((group) => {
    const rows = allCommands().filter((command) => command.group === group && command.keys.length > 0);
    return (
      rows.length > 0 &&
      h(
        "section",
        {},
        h("h3", {}, t(`group.${group}`)),
        h(
          "dl",
          {},
          rows.map((command) => [h("dt", {}, t(`command.${command.id}`)), h("dd", {}, marksOf(command))]),
        ),
      )
    );
  });
  dialog({
    title: t("command.help"),
    wide: true,
    className: "help",
    fill: () => [h("div.help-grid", {}, sections.filter(Boolean))],
  });
}
