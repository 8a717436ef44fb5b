// Runs before the page is drawn: the chosen theme must not come after the first picture.
try {
  const theme = JSON.parse(localStorage.getItem("orvel.theme") ?? "null");
  if (theme === "light" || theme === "dark") document.documentElement.dataset.theme = theme;
} catch {
  // No storage: the system's theme.
}
