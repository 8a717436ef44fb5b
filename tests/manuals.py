#!/usr/bin/python3
"""The manual pages leave nothing out: exported names, settings, options of shares, commands.

  manuals.py SOURCE BUILD
"""
import pathlib
import re
import subprocess
import sys

source, build = pathlib.Path(sys.argv[1]), pathlib.Path(sys.argv[2])
failures = []


def expect(condition, what):
    if not condition:
        failures.append(what)


def page(name):
    return (source / "docs/man" / (name + ".scd")).read_text().replace("\\", "")


def has(text, word):
    return re.search(r"(?<!\w)" + re.escape(word) + r"(?!\w)", text) is not None


def code(*folders):
    return "\n".join(path.read_text() for folder in folders for path in (source / folder).rglob("*.cpp"))


# A function stands in bold with its arguments, a member on the page of its class.
library = [page(path.stem) for path in (source / "docs/man").glob("*.3.scd") if path.stem != "vexo.3"]
exported = (source / "tests/exports.txt").read_text().splitlines()
for line in exported:
    name = re.sub(r"^(typeinfo( name)?|vtable) for ", "", re.sub(r"\[abi:cxx11\]|\(.*", "", line))
    scope, _, last = name.rpartition("::")
    holder = (scope or name).split("::")[-1]
    if scope and holder != "OrvelLogin" and holder != "FileSearch":
        word = last.removeprefix("~")
        expect(any(re.search(rf"\*([\w:]+::)?{holder}(::\w+)?\*", text) and has(text, word) for text in library), f"no entry: {line}")
    else:
        expect(any(re.search(rf"\*([\w:]+::)?{last}\*", text) for text in library), f"no entry: {line}")
expect(len(exported) > 200, "no exported names")

platform = page("vexo.3")
names = 0
for header in sorted((source / "platform/include/vexo").glob("*.h")):
    text = re.sub(r"#[^\n]*|//[^\n]*|/\*.*?\*/", "", header.read_text(), flags=re.S)
    found = re.findall(r"VEXO_API [^;{(]*?(\w+)\s*\(", text) + re.findall(r"class VEXO_API (\w+)", text)
    names += len(found)
    for name in found:
        expect(f"*{name}*" in platform and f"*vexo/{header.name}*" in platform, f"vexo(3): no entry: {name} of {header.name}")
expect(names > 100, "no names of the platform")

# Where a setting is read its name is the first literal of the call.
readers = r"(?:(?:Info\(\)|settings)\.Get|lookUp|CheckKeyValue|GetKeyValue|SupportGet|readSetting<\d+>|number|users|setting)"
settings = set()
for arguments in re.findall(rf"\b\w*{readers}\(((?:k\w+, )?[^,;)]*)", code("src", "apps", "platform/linux")):
    settings.update(re.findall(r'"([A-Za-z]\w+)"', arguments))
described = {name for line in page("orvel-settings.5").splitlines() if line.startswith("*") for name in re.findall(r"\*(\w+)\*(?!\()", line)}
described.discard("link_policy_SHARE")
settings.discard("link_policy_")
everything = code("src", "apps", "platform/linux")
expect(len(settings) > 20, f"settings read: {settings}")
expect(settings <= described, f"orvel-settings(5) lacks {settings - described}")
expect(not [name for name in described if f'"{name}"' not in everything], f"nobody reads one of {described - settings}")

# By the form in which the options that a share honours are compared: without blanks, in lower case.
honoured = set(re.findall(r'"(vexo:\w+)"', code("platform/linux/shares")))
expect(len(honoured) > 3, f"options of shares: {honoured}")
for option in honoured:
    expect(has(page("orvel-shares.5"), option), f"orvel-shares(5) lacks {option}")

made = build / "docs/man"
for path in (source / "docs/man").glob("*.scd"):
    expect((made / path.stem).is_file(), f"{path.stem} was not made; is scdoc installed?")
listed = subprocess.run([build / "apps/orvelctl/orvelctl", "--help"], capture_output=True, text=True, check=True).stdout
commands = re.findall(r"^  (\w+) ", listed, re.M)
rendered = (made / "orvelctl.1").read_text() if (made / "orvelctl.1").is_file() else ""
expect(len(commands) > 5, f"commands: {listed}")
for command in commands:
    expect(f".SS {command}\n" in rendered, f"orvelctl(1) lacks {command}")

for failure in failures:
    print("FAILED:", failure)
print(f"{len(exported)} exported names, {names} of the platform, {len(settings)} settings, {len(commands)} commands looked for")
sys.exit(1 if failures else 0)
