var visitorTexts = {
  title: "Shared with you",
  password: "Password",
  open: "Open",
  wrong: "That password is not right, or too many attempts failed.",
  wait: "Others try too: your password will be checked in {seconds} s.",
  gone: "This link is not available.",
  blocked: "Too many failed attempts. Try again later.",
  failed: "This cannot be shown now. Try again later.",
  empty: "This folder is empty.",
  name: "Name",
  size: "Size",
  changed: "Changed",
  folder: "Folder",
  downloadAll: "Download everything as zip",
  download: "Download",
  more: "Show more",
  top: "Shared folder"
};
