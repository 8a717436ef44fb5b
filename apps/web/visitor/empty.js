// A part of the page that the view of a public link does not use.
