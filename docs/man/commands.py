#!/usr/bin/env python3
"""usage: commands.py PAGE PROGRAM...: prints the page with its line @COMMANDS@ replaced by what the program's --help says,
level by level."""
import re
import subprocess
import sys


def sections(text):
    """A help text's first line, usage line, and the pairs of its sections."""
    text = re.sub(r"^(  \S+(?: \S+)*)\n {10,}(?=\S)", r"\1  ", text, flags=re.MULTILINE)  # a long name stands alone
    lines = re.sub(r"\n {7,}(?=\S)", " ", text).splitlines()  # what does not fit on a line goes on indented
    found = {"title": lines[0], "usage": next(line for line in lines if line.startswith("Usage: "))[len("Usage: "):]}
    for line in lines:
        if heading := re.fullmatch(r"(\w+):", line):
            pairs = found[heading[1]] = []
        elif pair := re.fullmatch(r"  (\S.*?)  +(\S.*)", line):
            pairs.append((pair[1], pair[2]))
    return found


def plain(text):
    return re.sub(r"([\\`*_\[\]<>|#])", r"\\\1", text)


def sentence(text):
    return f"{text[0].upper()}{text[1:]}." if text else ""


def entry(usage, about):
    words = [f"*{plain(word)}*: {plain(meaning)}" for word, meaning in about.get("Words", [])]
    options = [f"**{plain(word)}**: {plain(meaning)}" for word, meaning in about.get("Options", []) if "--help" not in word]
    name, _, arguments = usage.partition(" [OPTIONS]")
    print(f"\n**{plain(name)}**{plain(arguments)}\n: {sentence(plain(about['title']))}", sentence("; ".join(words + options)))


def describe(program, *words):
    text = subprocess.run([*program, *words, "--help"], stdout=subprocess.PIPE, text=True, check=True).stdout
    about = sections(text)
    if len(words) == 1:
        print(f"\n## {words[0]}\n\n{sentence(plain(about['title']))}")
    if "Commands" not in about:
        entry(about["usage"], about)
    for name, _ in about.get("Commands", []):
        describe(program, *words, name)


def main():
    with open(sys.argv[1], encoding="utf-8") as page:
        before, after = page.read().split("@COMMANDS@\n")
    print(before, end="")
    describe(sys.argv[2:])
    print(after, end="")


if __name__ == "__main__":
    main()
