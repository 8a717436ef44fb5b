// Imported by each module that is loaded when it is first needed: it does not run before its texts and looks are there.

import { loadStyle } from "./dom.js";
import { addTexts } from "./strings.js";

await Promise.all([addTexts("later/"), loadStyle("later")]);
