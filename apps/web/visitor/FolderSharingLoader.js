// Starts the view of a public link. The page gives its language, the prefix of addresses and the shared path as g_Lang,
// g_Tunnel and g_FolderPath; it does not say itself that its layout follows the width of a phone.
(function () {
  "use strict";
  const viewport = document.createElement("meta");
  viewport.name = "viewport";
  viewport.content = "width=device-width, initial-scale=1";
  document.head.append(viewport);
  document.documentElement.lang = g_Lang;
  const view = import(g_Tunnel + "/visitor/main.js");
  document.addEventListener("DOMContentLoaded", () => {
    view.then((module) => module.start()).catch(() => {
      document.body.textContent = window.visitorTexts.failed;
    });
  });
})();
