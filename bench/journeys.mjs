// What people come for, done from the beginning to the end, and the steps of the hand that each takes: a click, a key, a
// word that is typed, files that are chosen.
//   tests/web/run.sh $PWD/script/server $PWD/build/release $PWD/bench/journeys.mjs
import assert from "node:assert/strict";
import { execFileSync } from "node:child_process";
import { existsSync, readdirSync, readFileSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";
import { choose, finish, newPage, openPage, row, rowsReady } from "../tests/web/browser.mjs";
import { localFiles, ownFolder, until } from "../tests/web/support.mjs";

const pictures = join(process.env.ORVEL_TEST_PHOTO, "Landscapes");
const picture = readFileSync(join(pictures, readdirSync(pictures)[0]));
const ITEMS = {
  "house/": "",
  "more/": "",
  "notes.md": "# Notes\n",
  "part 2.txt": "2",
  "part 10.txt": "10",
  "picture 1.png": picture,
  "picture 2.png": picture,
};
for (let i = 0; i < 30; ++i) ITEMS[`more/file ${i}`] = "x";
const local = localFiles("journeys", { "one.txt": "1", "two.txt": "2", "trip/day.txt": "3" });
const folder = ownFolder("journeys", ITEMS);
execFileSync("python3", ["-m", "zipfile", "-c", join(folder, "packed.zip"), "one.txt", "trip"], { cwd: local });

const is = (name, text = undefined) =>
  until(`“${name}”`, () => existsSync(join(folder, name)) && (text === undefined || readFileSync(join(folder, name), "utf8") === text));
const isGone = (name) => until(`the end of “${name}”`, () => !existsSync(join(folder, name)));

// The hand of a user: each of its movements is counted.
class Hand {
  steps = 0;
  constructor(page) {
    this.page = page;
  }
  does(action) {
    ++this.steps;
    return action;
  }
  click = (what) => this.does(this.page.click(what));
  key = async (...keys) => {
    for (const one of keys) await this.does(this.page.keyboard.press(one));
  };
  type = (what, text) => this.does(this.page.fill(what, text));
  choose = (name, options) => this.does(choose(this.page, name, options));
  open = (name) => this.does(row(this.page, name).dblclick());
  files = async (command, paths) => {
    const chooser = this.page.waitForEvent("filechooser");
    await this.click("#toolbar >> text=Upload");
    await this.click(`.menu >> text=${command}`);
    await this.does((await chooser).setFiles(paths));
  };
  shows = (what) => this.page.waitForSelector(what);
  finished = (text) => this.page.locator(".activity-card.good", { hasText: text }).first().waitFor({ state: "attached" });
}

const HERE = "/projects/journeys";
let address;

const JOURNEYS = [
  ["open a share and a folder in it", "/", async (hand) => {
    await hand.click(".home >> text=projects");
    await hand.open("journeys");
    await hand.shows("#view >> text=notes.md");
  }],
  ["see pictures as pictures", HERE, async (hand) => {
    await hand.key("Alt+2");
    await hand.shows(".thumbnail.loaded img");
  }],
  ["look at a picture, closer, and at the next", HERE, async (hand) => {
    await hand.open("picture 1.png");
    await hand.shows(".preview .stage > img");
    await hand.key("+", "ArrowRight");
    await hand.shows(".preview-title b:has-text('picture 2.png')");
  }],
  ["send files", HERE, async (hand) => {
    await hand.files("Upload files", ["one.txt", "two.txt"].map((name) => join(local, name)));
    await hand.finished("2 files uploaded");
  }],
  ["send a folder", HERE, async (hand) => {
    await hand.files("Upload a folder", join(local, "trip"));
    await is("trip/day.txt", "3");
  }],
  ["send a file that is there, and keep both", HERE, async (hand) => {
    await hand.files("Upload files", join(local, "one.txt"));
    await hand.click(".dialog >> text=Keep both");
    await is("one (2).txt", "1");
  }],
  ["make a folder", HERE, async (hand) => {
    await hand.key("Alt+n");
    await hand.type(".dialog .input", "new");
    await hand.key("Enter");
    await is("new");
  }],
  ["write a text", HERE, async (hand) => {
    await hand.key("Alt+t");
    await hand.type(".dialog .input", "list.md");
    await hand.key("Enter");
    await hand.shows(".editor .cm-focused");
    await hand.does(hand.page.keyboard.type("bread"));
    await hand.key("Control+s");
    await is("list.md", "bread");
  }],
  ["change a text", HERE, async (hand) => {
    await hand.choose("notes.md");
    await hand.key("F4");
    await hand.shows(".editor .cm-focused");
    await hand.key("Control+End");
    await hand.does(hand.page.keyboard.type("more"));
    await hand.key("Control+s");
    await is("notes.md", "# Notes\nmore");
  }],
  ["rename", HERE, async (hand) => {
    await hand.choose("part 2.txt");
    await hand.key("F2");
    await hand.type(".in-place", "part 3.txt");
    await hand.key("Enter");
    await is("part 3.txt");
  }],
  ["copy to another folder", HERE, async (hand) => {
    await hand.choose("notes.md");
    await hand.click("#toolbar >> text=Copy to");
    await hand.click(".picker >> text=house");
    await hand.click(".picker >> text=Copy here");
    await is("house/notes.md");
  }],
  ["move by keys", HERE, async (hand) => {
    await hand.choose("part 3.txt");
    await hand.key("Control+x");
    await hand.open("house");
    await hand.shows("#view >> text=notes.md");
    await hand.key("Control+v");
    await is("house/part 3.txt");
  }],
  ["delete, and take it back", HERE, async (hand) => {
    await hand.choose("part 10.txt");
    await hand.key("Delete");
    await isGone("part 10.txt");
    await hand.finished("Delete “part 10.txt”");
    await hand.key("Control+z");
    await is("part 10.txt");
  }],
  ["delete everything in a folder", `${HERE}/more`, async (hand) => {
    await hand.key("Control+a");
    await hand.shows("#toolbar >> text=Delete");
    await hand.key("Delete");
    await until("an empty folder", () => readdirSync(join(folder, "more")).length === 0);
  }],
  ["find what was deleted, and restore it", "/", async (hand) => {
    await hand.click("#deleted-link");
    await hand.type("#find", "file 29");
    await hand.choose("file 29");
    await hand.click("#toolbar [data-command=restore]");
    await is("more/file 29");
  }],
  ["find by name below a folder", HERE, async (hand) => {
    await hand.type("#find", "day*");
    await hand.key("Enter");
    await hand.shows("#status >> text=1 found");
  }],
  ["narrow a folder", HERE, async (hand) => {
    await hand.type("#find", "picture");
    await hand.shows("#status >> text=2 items");
  }],
  ["sort by size, numbers by value", HERE, async (hand) => {
    await hand.click("[data-sort=size]");
    await hand.shows("[aria-sort] [data-sort=size]");
  }],
  ["go where one types", "/", async (hand) => {
    await hand.key("Control+l");
    await hand.type("#pathbar input", `${HERE}/house`);
    await hand.key("Enter");
    await hand.shows("#view >> text=part 3.txt");
  }],
  ["keep a favourite, and go there", "/projects", async (hand) => {
    await hand.choose("journeys", { button: "right" });
    await hand.click(".menu >> text=Add to favourites");
    await hand.click(".brand");
    await hand.click("section[aria-label=Favourites] >> text=journeys");
    await hand.shows("#view >> text=notes.md");
  }],
  ["download one", HERE, async (hand) => {
    await hand.choose("notes.md");
    const download = hand.page.waitForEvent("download");
    await hand.key("Control+s");
    assert.equal((await download).suggestedFilename(), "notes.md");
  }],
  ["download several as one", HERE, async (hand) => {
    await hand.choose("picture 1.png");
    await hand.choose("picture 2.png", { modifiers: ["Control"] });
    const download = hand.page.waitForEvent("download");
    await hand.key("Control+s");
    assert.match((await download).suggestedFilename(), /\.zip$/);
  }],
  ["pack", HERE, async (hand) => {
    await hand.choose("house");
    await hand.click("[aria-label='More actions']");
    await hand.click(".menu >> text=Pack");
    await hand.shows(".dialog input:focus");
    await hand.key("Enter");
    await is("house.zip");
  }],
  ["look into an archive", HERE, async (hand) => {
    await hand.open("packed.zip");
    await hand.shows(".archive .archive-name:has-text('trip')");
  }],
  ["what a folder holds", HERE, async (hand) => {
    await hand.choose("house");
    await hand.key("Alt+Enter");
    await hand.shows("dialog .sizes:not([aria-busy]) dt >> text=Contains");
  }],
  ["what takes the space", HERE, async (hand) => {
    await hand.key("Alt+s");
    await hand.shows(".space .treemap .tile");
  }],
  ["see who may do what", HERE, async (hand) => {
    await hand.choose("notes.md");
    await hand.key("Alt+p");
    await hand.shows(".permissions .rights");
  }],
  ["give away by a link", HERE, async (hand) => {
    await hand.choose("house");
    await hand.click("#toolbar >> text=Share a link");
    await hand.type("[name=password]", "");
    await hand.click(".dialog >> text=Create link");
    address = await hand.page.inputValue(".address");
  }],
  ["open what was given away", undefined, async (hand) => {
    await hand.does(hand.page.goto(address));
    await hand.shows("text=part 3.txt");
  }],
  ["let others send files", HERE, async (hand) => {
    await hand.choose("house", { button: "right" });
    await hand.click(".menu >> text=Receive files by a link");
    await hand.click(".dialog >> text=Create link");
    assert.match(await hand.page.inputValue(".address"), /^http/);
  }],
  ["earlier versions", HERE, async (hand) => {
    await hand.choose("notes.md");
    await hand.key("Alt+v");
    await hand.shows(".versions-empty, .versions-list");
  }],
  ["see what somebody else adds", HERE, async (hand) => {
    writeFileSync(join(folder, "from bob.txt"), "hello");
    await hand.shows("#view >> text=from bob.txt");
  }],
  ["make it dark", HERE, async (hand) => {
    await hand.click("#settings-button");
    await hand.click(".menu >> text=Dark");
    await hand.shows("html[data-theme=dark]");
  }],
  ["learn the keys", HERE, async (hand) => {
    await hand.key("?");
    await hand.shows(".dialog >> text=Keyboard shortcuts");
  }],
];

test("journeys", { timeout: 1_200_000 }, async (context) => {
  const lines = [];
  for (const [name, place, walk] of JOURNEYS)
    await context.test(name, async () => {
      const page = place === undefined ? await newPage() : await openPage("alice", { path: place, kept: name.includes("favourite"), follows: name.includes("somebody else") });
      await finish(page, async () => {
        if (place !== undefined) await rowsReady(page);
        const hand = new Hand(page);
        await walk(hand);
        lines.push(`${String(hand.steps).padStart(2)}  ${name}`);
      });
    });
  console.log(`steps, journey\n${lines.join("\n")}\n${lines.length} of ${JOURNEYS.length}`);
});
