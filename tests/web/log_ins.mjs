// What a machine may ask and refuse at a log-in, by a PAM service of the tests' own: the ways that both browsers go.
import { readFileSync, rmSync, writeFileSync } from "node:fs";
import { join } from "node:path";

const { ORVEL_TEST_DEMO: demo, ORVEL_TEST_PAM_TOLD: told, VEXO_GATE_PAM: service } = process.env;
const auth = (more = "") => `auth required ${told} ask=Password: want=word ${more}\n`;
const account = (more = "") => `account required ${told} ${more}\n`;
const code = auth("say=Sent. [show=One-time code: ] want=123456") + account();
const toChange = auth() + account("must_change");
const toBlock = 'autoblock_attempts="1"\n';

// stack; what is asked and answered; the complaint at the end, "" for who is let in; settings meanwhile
const WAYS = [
  { stack: auth() + account("locked"), answers: [["Password", "word"]], said: "Your account is locked" },
  { stack: toChange + `password required ${told} locked\n`, answers: [["Password", "word"]], said: "your password has and was not changed" },
  { stack: code, answers: [["Password", "word"], ["One-time code", "000000"]], said: "do not fit together" },
  { stack: code, answers: [["Password", "word"], ["One-time code", "123456"]], said: "" },
  {
    stack: `${toChange}password required ${told} [ask=Current password: ] want=word [ask=New password: ] want=fresh [ask=Retype new password: ] want=fresh\n`,
    answers: [["Password", "word"], ["Present password", "word"], ["New password", "fresh"], ["New password once more", "fresh"]],
    said: "",
  },
  { stack: auth() + account(), answers: [["Password", "wrong"]], said: "do not fit together", settings: toBlock },
  { stack: auth() + account(), answers: [["Password", "word"]], said: "Too many attempts failed from this address. Try again in", settings: toBlock },
];

// `open` goes to the page, where nobody is logged in; `fill` and `see` wait for what they name; `leave` logs out.
export async function goAllWays({ open, fill, enter, see, leave }) {
  const file = join(demo, "etc/vexoinfo.conf"), settings = readFileSync(file, "utf8");
  try {
    for (const way of WAYS) {
      writeFileSync(join(service, "orvel"), way.stack);
      writeFileSync(file, settings + (way.settings ?? ""));
      await open();
      await fill(".login [name=user]", "alice");
      for (const [asked, answer] of way.answers) {
        await see(".login .field", asked);
        await fill(asked === "Password" ? ".login [name=password]" : ".login [name=answer]", answer);
        await enter();
      }
      if (way.said) await see(".login .complaint", way.said);
      else await leave();
    }
  } finally {
    rmSync(join(service, "orvel"), { force: true });
    writeFileSync(file, settings);
    rmSync(join(demo, "var/lib/vexo/autoblock.db"), { force: true });
  }
}
