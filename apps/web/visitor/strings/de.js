var visitorTexts = {
  title: "Für Sie freigegeben",
  password: "Passwort",
  open: "Öffnen",
  wrong: "Das Passwort stimmt nicht, oder es gab zu viele Fehlversuche.",
  wait: "Auch andere versuchen es: Ihr Passwort wird in {seconds} s geprüft.",
  gone: "Dieser Link ist nicht verfügbar.",
  blocked: "Zu viele Fehlversuche. Versuchen Sie es später noch einmal.",
  failed: "Das kann jetzt nicht angezeigt werden. Versuchen Sie es später noch einmal.",
  empty: "Dieser Ordner ist leer.",
  name: "Name",
  size: "Größe",
  changed: "Geändert",
  folder: "Ordner",
  downloadAll: "Alles als Zip-Datei herunterladen",
  download: "Herunterladen",
  more: "Mehr anzeigen",
  top: "Freigegebener Ordner"
};
