"""The manual pages, against the program, the headers and the sources that they tell of."""
import re

import pytest
from conftest import BUILD, ROOT, STAGE, run, tracked

PAGES = ["kovanet.1", "kovanet-files.5", "kovanetsdk.7"]
KOVANET = BUILD / "tools" / "kovanet" / "kovanet"
SOURCES = tracked("src/*.cpp", "src/*.h", "platform/src/*.cpp", "platform/src/*.h")
LITERAL = re.compile(r"""'(?:[^'\\]|\\.)'|"((?:[^"\\]|\\.)*)\"""")  # a character's quote begins no text
CONSTANT = re.compile(r'constexpr (?:const )?char ?\*?(?:const )?(k\w+)(?:\[\])? = "([^"]*)"')
# calls that are given keys: of the platform, of src/core, and the readers and writers that units have for their own file
KEY_CALL = re.compile(r"\b(\w*Key\w*|\w*_keys?|is_set_to|set|remove)\((?=([^;{]*))")
NO_KEYS = {"NETWORK", "BROADCAST", "PATH", "XXXXXX"}  # what /bin/ipcalc prints, an environment, the end of a template


def installed(page):
    return STAGE / "usr" / "share" / "man" / f"man{page[-1]}" / page


def rendered(page):
    text = run("man", "--warnings=w", "-l", installed(page), env={"LC_ALL": "C.UTF-8", "MANWIDTH": "1000", "PATH": "/usr/bin"})
    return re.sub(r" +", " ", text)


@pytest.mark.parametrize("page", PAGES)
def test_page_is_installed_and_formats_without_a_warning(page):
    text = rendered(page)
    assert "warning:" not in text
    assert re.search(rf"^NAME\n {page[:-2]} - \w", text, re.MULTILINE)


# ---- kovanet(1)

def commands(*words):
    """Every command that can be run, with the options that its --help tells."""
    text = run(KOVANET, *words, "--help")
    head, _, below = text.partition("\nCommands:\n")
    if not below:
        yield " ".join(["kovanet", *words]), re.findall(r"^  (--[\w-]+)", head, re.MULTILINE)
    for name in re.findall(r"^  ([\w-]+)  ", below.partition("\n\n")[0], re.MULTILINE):
        yield from commands(*words, name)


def test_every_command_and_option_has_an_entry():
    entries = re.split(r"\n\n", rendered("kovanet.1"))
    found = list(commands())
    assert len(found) > 50
    missing = []
    for command, options in found:
        entry = next((entry for entry in entries if re.match(rf" {command}( [^a-z]|\n| [a-z|]+\|| \[)", entry + "\n")), None)
        missing += [command] if entry is None else [
            f"{command} {option}" for option in options if option != "--help" and option not in entry]
    assert not missing, "not in kovanet(1): " + ", ".join(missing)


def test_help_fits_a_terminal_and_has_an_example_of_each_command():
    wide, without = [], []
    for command, _ in commands():
        text = run(KOVANET, *command.split()[1:], "--help")
        wide += [f"{command}: {line}" for line in text.splitlines() if len(line) >= 80]
        without += [] if re.search(rf"^Examples:\n(  .*\n)*  {command}( |\n)", text, re.MULTILINE) else [command]
    assert not wide and not without, (wide, without)


# ---- kovanetsdk(7)

def test_error_table_is_that_of_the_header():
    header = (ROOT / "include" / "kovanetsdk" / "core.h").read_text().replace("\\\n", " ")
    defined = {name: (code, re.sub(r"\s+", " ", meaning).strip()) for name, code, meaning in
               re.findall(r"#define (NET_ERR_\w+)\s+(0x\w+)\s+/\*\*<(.*?)\*/", header, re.DOTALL)}
    page = (ROOT / "docs" / "man" / "kovanetsdk.7.md").read_text()
    told = {name: (code, meaning) for name, code, meaning in re.findall(r"^\| (NET_ERR_\w+) \| (\w+) \| (.*) \|$", page, re.MULTILINE)}
    assert len(defined) == len(re.findall(r"#define NET_ERR_", header)) > 0
    assert told == defined


# ---- kovanet-files(5)

def told_names():
    """What the page sets in code: names of files and keys, with words in capitals for what differs."""
    return set(re.findall(r"`([^`]+)`", (ROOT / "docs" / "man" / "kovanet-files.5.md").read_text()))


def is_told(literal, told):
    """Whether the page has what a literal, a format perhaps, makes, or the directory, or what the literal begins."""
    sample = re.sub(r"%(?:\w|016llx)", "X", literal)
    return any(name.startswith(sample) or re.fullmatch(re.sub("[A-Z]+", "[A-Z]+", re.escape(name)) + (".*" if name.endswith("/") else ""),
                                                       sample) for name in told)


def test_every_path_is_told():
    told = told_names()
    missing = {f"{literal} of {source.relative_to(ROOT)}" for source in SOURCES
               for literal in LITERAL.findall(re.sub(r"//.*", "", source.read_text()))
               if re.fullmatch(r"/[\w.-]+/[\w./%-]+", literal) and literal not in ("/dev/null", "/proc/self")
               and not is_told(literal, told)}
    assert not missing, "not in docs/man/kovanet-files.5.md: " + ", ".join(sorted(missing))


def keys_of_sources():
    """Texts that are given to calls as keys, and texts in the form of keys of the interface files and events."""
    constants = {}
    for source in SOURCES:
        for name, text in CONSTANT.findall(source.read_text()):
            constants.setdefault(name, []).append((source.parent, text))
    for source in SOURCES:
        text = re.sub(r"//[^\n]*|/\*.*?\*/", "", source.read_text(), flags=re.DOTALL)
        for literal in LITERAL.findall(text):
            form = r"[A-Z][A-Z0-9_]+(?:%d)?" if "platform" not in source.parts else r"[A-Z][A-Z0-9_]+|[a-z]+_[a-z_]+"
            name = re.fullmatch(rf"({form})(?:=.*)?", literal)
            if name and len(name[1]) > 2 and name[1] not in NO_KEYS:
                yield source, name[1]
        for call, arguments in KEY_CALL.findall(text):
            before = "" if "INFO" in call else "[^,]*, *"  # the key comes behind the file, if there is one
            given = re.findall(rf'^{before}"(\w+)"', arguments) + [
                value for name in re.findall(r"\bk[A-Z]\w*", arguments) for folder, value in constants.get(name, [])
                if folder in (source.parent, ROOT / "src" / "core")]
            for key in given:
                if re.fullmatch(r"[A-Za-z%][\w%-]*", key):
                    yield source, key


def test_every_key_is_told():
    told = told_names()
    keys = set(keys_of_sources())
    assert {"dns_mode", "BLOCK_HA", "IPADDR", "externalIP", "pppoe_enable"} <= {key for _, key in keys}
    missing = sorted(f"{key} of {source.relative_to(ROOT)}" for source, key in keys
                     if not any(re.fullmatch(re.sub(r"%\w|_$", "_?[A-Z]+", key), name) for name in told))
    assert not missing, "not in docs/man/kovanet-files.5.md: " + ", ".join(missing)


def test_every_path_told_is_known():
    """A name that the page gives stands in the sources or is laid out on the appliance."""
    known = "\n".join(path.read_text() for path in [*SOURCES, *tracked("appliance/root/*")] if not path.is_symlink())
    strange = []
    for name in told_names():
        beginning = re.match(r"/[a-z0-9._/-]*", name)
        is_known = any(part in known for part in [beginning[0], name.rpartition("/")[2]] if part) if beginning else True
        if not is_known and not (ROOT / "appliance" / "root" / beginning[0][1:]).exists():
            strange.append(name)
    assert not strange, "in docs/man/kovanet-files.5.md only"
