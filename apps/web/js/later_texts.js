// Imported by each module that is loaded when it is first needed: it does not run before its texts are there.

import { addTexts } from "./strings.js";

await addTexts("later/");
