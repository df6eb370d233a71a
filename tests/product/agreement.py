#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Program, manual page and completion say the same: agreement.py BUILD_DIR

What the program knows is asked of the program itself, in an empty root where it finds no disk and no
tool, and read from the words it is made of.
"""
import glob
import os
import re
import shutil
import subprocess
import sys
import tempfile

sys.path.insert(0, os.path.join(os.path.dirname(__file__), "../support/verdict"))
sys.path.insert(0, os.path.join(os.path.dirname(__file__), "../../docs/pictures"))
import calls  # noqa: E402
import layouts  # noqa: E402
import verdict  # noqa: E402
from verdict import ROOT, read  # noqa: E402

PROGRAM = os.path.join(os.path.abspath(sys.argv[1]), "tool/arrayctl")
COMMANDS = ("status", "destroy", "newvol", "initsys", "initsys-dd", "enumformatalldisks",
            "enumformatalldisks_indualhead_install")
MODEL = "maxdisks=4\nsupportraid=yes\nusbportcfg=0xf0\ninternalportcfg=0xf\n"
LITERAL = r'((?:"(?:[^"\\]|\\.)*"\s*)+)'


def sources():
    paths = glob.glob("tool/*.cpp", root_dir=ROOT) + glob.glob("lib*/lib/*/*.cpp", root_dir=ROOT)
    return "".join(read(path) for path in sorted(paths))


def literal(text):
    """The bytes of adjacent string literals."""
    joined = "".join(re.findall(r'"((?:[^"\\]|\\.)*)"', text))
    return joined.replace(r"\n", "\n").replace(r"\t", "\t").replace(r"\"", '"')


def page():
    """The page as it is read, one line a paragraph, in plain letters."""
    text = subprocess.run(["mandoc", "-Tascii", "-O", "width=1000", "tool/arrayctl.8"], cwd=ROOT, check=True,
                          capture_output=True, text=True).stdout
    return re.sub(r".\x08", "", text)


def section(name):
    return re.search(rf"^{name}\n(.*?)(?=^[A-Z])", page(), re.S | re.M).group(1)


def words_of(rows):
    """The words of a constant table in the program."""
    table = re.search(rf"{rows}\[\] = \{{(.*?)\n?\}};", read("tool/arrayctl.cpp"), re.S).group(1)
    return re.findall(r'"([^"]*)"', re.sub(r"//.*", "", table))


def run(*arguments):
    """The program in an empty root that holds its loader, the C library and a model without disks."""
    with tempfile.TemporaryDirectory() as root:
        libraries = subprocess.run(["ldd", PROGRAM], check=True, capture_output=True, text=True).stdout
        for library in re.findall(r"(/\S+)", libraries):
            os.makedirs(root + os.path.dirname(library), exist_ok=True)
            shutil.copy(library, root + library)
        for folder in ("tmp", "etc.defaults", "dev"):
            os.makedirs(os.path.join(root, folder))
        open(os.path.join(root, "dev/null"), "w", encoding="ascii").close()
        with open(os.path.join(root, "etc.defaults/nuroinfo.conf"), "w", encoding="ascii") as conf:
            conf.write(MODEL)
        shutil.copy(PROGRAM, root + "/arrayctl")
        ended = subprocess.run(["chroot", root, "/arrayctl", *arguments], capture_output=True, text=True,
                               check=False)
        assert ended.stderr == "", ended.stderr
        return ended.stdout, ended.returncode


def case_the_page_has_the_commands_of_the_program():
    verdict.same(re.findall(r"^     arrayctl (\S+)", section("SYNOPSIS"), re.M), words_of("COMMANDS"), "SYNOPSIS")
    verdict.same(re.findall(r"^   (\S+)", section("DESCRIPTION"), re.M), words_of("COMMANDS"), "DESCRIPTION")


def case_the_completion_has_the_commands_of_the_program():
    listed = re.search(r"words=\((status.*?)\)", read("tool/completion/arrayctl"), re.S).group(1)
    verdict.same(listed.split(), words_of("COMMANDS"), "completion")


def case_the_program_knows_these_commands_and_no_other():
    verdict.same(words_of("COMMANDS"), COMMANDS, "program")
    for word in COMMANDS:
        assert "command not recognized" not in run(word, "7")[0], word
    assert run("stop")[0].startswith("command not recognized\nusage:\n")


def case_the_usage_has_the_first_five_commands():
    text, status = run()
    assert status == 1
    verdict.same(re.findall(r"^\tarrayctl (\S+)", text, re.M), COMMANDS[:5], "usage")
    assert "it leaves out the two enumerations" in page()


def case_the_page_has_every_word_of_a_report():
    for table in ("LEVEL_WORDS", "STATUS_WORDS", "REBUILD_WORDS", "DISK_WORDS"):
        for word in words_of(table):
            assert f"`{word[:15]}'" in page(), word


def case_the_page_has_every_message():
    """Each text of the program for people, up to the first value in it."""
    printed = re.findall(r"(?:puts|printf)\(\s*" + LITERAL, read("tool/arrayctl.cpp"))
    messages = {literal(text) for text in printed} - {"%s"}
    heads = [re.split(r"%\d*[a-z.*]+|\n", message)[0].strip("\t [") or message for message in messages]
    heads = [head.strip() for head in heads if not head.startswith("%s") and head.strip(" %s[]:.*\n\t")]
    assert len(heads) >= 12, heads
    for head in heads:
        assert head in page(), head


def case_the_page_has_the_exit_statuses():
    statuses = section("EXIT STATUS")
    verdict.same(re.findall(r"^     (\d+|number of disks)\b", statuses, re.M), ("0", "1", "number of disks", "255"),
               "EXIT STATUS")
    expected = {"status": 1, "destroy": 0, "newvol": 1, "initsys": 1, "initsys-dd": 1, "enumformatalldisks": 0,
                "enumformatalldisks_indualhead_install": 0}
    for word, status in expected.items():
        arguments = (word, "7") if word in ("status", "destroy") else (word,)
        assert run(*arguments)[1] == status, word
    constants = dict(re.findall(r"int (STATUS_\w+) = (-?\d+);", read("tool/arrayctl.cpp")))
    assert constants == {"STATUS_OK": "0", "STATUS_FAILED": "1", "STATUS_PUSH_FAILED": "-1"}, constants


def case_what_the_page_quotes_is_what_a_machine_without_disks_says():
    assert run("status", "7") == ("RAID /dev/md7 is not found\n", 1)
    assert run("destroy", "3") == ("Not found /dev/md3 \n", 0)
    assert run("newvol") == ("No disk to create RAID... \n", 1)
    assert run("initsys-dd")[0] == "system init with nurodd failed\n"
    for quoted in ("RAID /dev/md7 is not found", "Not found /dev/md3", "No disk to create RAID...",
                   "system init with nurodd failed"):
        assert quoted in page(), quoted


def case_the_page_has_every_configuration_key_that_a_command_asks():
    asked = set(re.findall(r'NLIBCConfKeyIsYes\("(\w+)"\)', sources()))
    asked |= set(re.findall(r'KEY_[A-Z_]+\[\] = "(\w+)"', sources()))
    asked |= set(re.findall(r'NUROINFO_CONF_PATH, "(\w+)"', sources()))
    asked |= set(re.findall(r'"(\w+portcfg)"', sources()))
    # Asked by functions that no command calls.
    asked -= {"supportsas", "no_disk_swap"}
    assert len(asked) >= 10, asked
    for key in asked:
        assert re.search(rf"\b{key}\b", section("FILES")), key


def case_the_page_has_every_file():
    found = set(re.findall(r'"(/(?:tmp|etc\.defaults|var|run)/[^"%]+|/\.\w+)"', sources()))
    found |= set(re.findall(r'LOG_PATH\[\] = "([^"]+)"', sources()))
    assert len(found) >= 6, found
    for path in found:
        assert path in section("FILES"), path


def case_the_page_is_clean():
    pages = ["tool/arrayctl.8", "platform/mdrequests/mdrequests.8", "rehearse/arrayctl-rehearse.8"]
    lint = subprocess.run(["mandoc", "-Tlint", "-W", "warning", *pages], cwd=ROOT,
                          capture_output=True, text=True, check=False)
    assert lint.returncode == 0 and lint.stdout == "", lint.stdout


def case_the_log_page_has_every_line_that_ends_an_operation():
    written = {literal(text) for text in re.findall(r"NLIBCLog\(LOG_ERR,\s*" + LITERAL, sources())}
    calls = len(re.findall(r"NLIBCLog\(", sources()))
    understood = len(re.findall(r"NLIBCLog\(LOG_(?:ERR|DEBUG),\s*" + LITERAL, sources()))
    assert calls == understood, f"{calls - understood} log calls could not be read"
    told = read("docs/log.md").split("### Notes", 1)[1].split("## The operation error log")[0]
    told = re.sub(r"\n(?=[^|\n#])", " ", told)
    listed = {text for text in re.findall(r"`([^`]+)`", told)}
    missing = written - listed
    assert not missing, f"docs/log.md lacks {sorted(missing)}"
    foreign = {text for text in listed - written if re.search(r"%[a-z]", text)}
    assert not foreign, f"docs/log.md has what nothing writes: {sorted(foreign)}"


def case_the_architecture_page_has_the_functions_that_no_command_calls():
    listed = re.search(r"## Functions that no command calls\n(.*?)\n## ", read("docs/architecture.md"), re.S).group(1)
    rows = re.findall(r"^\| `(\w+)` \| (.*?) \| .*? \|$", listed, re.M)
    verdict.same([name for _, names in rows for name in re.findall(r"`(\w+)`", names)], calls.uncalled(), "architecture.md")
    tests = "".join(read(path) for path in glob.glob("tests/*/*_test.cpp", root_dir=ROOT))
    for module, names in rows:
        header = read(*glob.glob(f"lib*/include/*/{module}.h", root_dir=ROOT))
        for name in re.findall(r"`(\w+)`", names):
            assert re.search(rf"\b{name}\(", header), f"{name} is not in {module}.h"
            assert re.search(rf"\b{name}\(", tests), f"no test calls {name}"


def case_the_log_page_tells_which_lines_no_command_can_write():
    by_commands, by_others = set(), set()
    reached = calls.reached(calls.graph())
    for node, texts in calls.graph().items():
        found = re.findall(r"NLIBCLog\(LOG_ERR,\s*" + LITERAL, "".join(texts))
        (by_commands if node in reached else by_others).update(literal(text) for text in found)
    told = re.search(r"### Never by a command\n(.*?)\n## ", read("docs/log.md"), re.S).group(1)
    told = re.sub(r"\[.*?\]\(.*?\)", "", told).replace("\n", " ")
    verdict.same(re.findall(r"`([^`]+)`", told), by_others - by_commands, "log.md")


def case_the_layouts_page_has_the_numbers_of_the_code():
    types = {name: f"{int(value, 16):x}" for name, value in re.findall(
        r"(TYPE_\w+) = (0x\w+);", read("libnurostoragecore/lib/partition/partition_type.h"))}
    expected = set()
    for version, machine, places in layouts.layouts(read(layouts.TABLE)):
        raid = machine == "RAID"
        linux = types["TYPE_RAID" if raid else "TYPE_LINUX"]
        swap = types["TYPE_RAID" if raid else "TYPE_SWAP"]
        # Behind the third fixed place there is a gap of the same length.
        _, start, size = places[-1]
        cells = [version, machine, *places[0][1:], linux, *places[1][1:], swap, start + (size or 0), linux]
        expected.add("| " + " | ".join(str(cell) for cell in cells) + " |")
    told = re.search(r"## The numbers\n.*?\n\|---.*?\n(.*?)\n\n", read("docs/layouts.md"), re.S).group(1)
    verdict.same(told.split("\n"), expected, "docs/layouts.md")
    assert len(expected) == 14, expected


def rows_of_recovery():
    """{number: its title and text} of the page."""
    parts = re.split(r"^### Row (\d+): ", read("docs/recovery.md"), flags=re.M)
    return dict(zip(map(int, parts[1::2]), parts[2::2]))


def verdicts_of_recovery():
    """(what led to the verdict, its row or None, the line) of all cases that cut the tool off."""
    for path in sorted(glob.glob("tests/appliance/cases/recovery*.sh", root_dir=ROOT)):
        begin, text = 0, read(path)
        for found in re.finditer(r"^ *verdict ['\"](?:row (\d+): )?.*$", text, re.M):
            row = found.group(1)
            yield text[begin:found.start()], int(row) if row else None, f"{path}: {found.group(0)}"
            begin = found.end()


def case_every_row_of_recovery_is_tested():
    rows = rows_of_recovery()
    assert sorted(rows) == list(range(1, len(rows) + 1)), sorted(rows)
    verdict.same((row for _, row, _ in verdicts_of_recovery() if row), rows, "docs/recovery.md")
    for row, text in rows.items():
        title = text.split("\n", 1)[0]
        anchor = re.sub(r"[^\w -]", "", f"row {row} {title}").lower().replace(" ", "-")
        assert f"(#{anchor})" in read("docs/recovery.md"), f"no link leads to {anchor}"


def case_what_the_tests_of_recovery_type_is_the_page():
    typed = set()
    for body, row, line in verdicts_of_recovery():
        ways = {(int(number), kind) for number, kinds in re.findall(r"^ *way_back (\d+) ?(\$?\w*)", body, re.M)
                for kind in (("", "stock") if kinds == "$kind" else (kinds,))}
        assert all(number == row for number, _ in ways), f"{line} types another row's block"
        assert row is None or ways or "```sh" not in rows_of_recovery()[row], f"{line} types nothing"
        typed |= ways
    told = {(row, kind) for row, text in rows_of_recovery().items()
            for kind in re.findall(r"^```sh ?(\w*)$", text.split("\n## ")[0], re.M)}
    verdict.same(typed, told, "blocks of docs/recovery.md")
    for row, text in rows_of_recovery().items():
        blocks = dict(re.findall(r"^```sh ?(\w*)\n(.*?)^```", text.split("\n## ")[0], re.S | re.M))
        assert ("sfdisk" in blocks.get("", "")) == ("stock" in blocks), f"row {row} for which partitioner?"
        calls = re.findall(r"\bsfdisk .*", blocks.get("stock", ""))
        assert all(call.startswith("sfdisk --lock ") for call in calls), f"row {row} beside udev"
    shown = {row for row, text in rows_of_recovery().items() if "```text\n" in text}
    seen = {row for body, row, _ in verdicts_of_recovery() if re.search(rf"looks_like {row}\b", body)}
    verdict.same(seen & shown, shown, "what one sees")


def numbers_of_layouts():
    """{(version, machine): where swap ends and where data begins} of docs/layouts.md."""
    lines = re.findall(r"^\| (\d) \| ([^|]*) \| (.*) \|$", read("docs/layouts.md"), re.M)
    cells = {(version, machine): line.split(" | ") for version, machine, line in lines}
    return {which: (int(line[3]) + int(line[4]), int(line[6])) for which, line in cells.items()}


def layouts_typed():
    """{(version, machine): rows} whose block was typed with the numbers of that line."""
    typed = {}
    for path in sorted(glob.glob("tests/appliance/cases/recovery*.sh", root_dir=ROOT)):
        versions, which = (), [("8", "RAID")]
        for line in read(path).split("\n"):
            versions = line[len("for layout in "):-len("; do")].split() if line.startswith("for layout in ") else versions
            told = re.fullmatch(r""" *numbers (\d|"\$layout") (?:(RAID)|'(.*)')""", line)
            if told:
                asked = versions if told.group(1).startswith('"') else told.group(1)
                which = [(version, told.group(2) or told.group(3)) for version in asked]
            way = re.match(r" *way_back (\d+)", line)
            for layout in which if way else ():
                typed.setdefault(layout, set()).add(int(way.group(1)))
            which = [("8", "RAID")] if way else which
    return typed


def case_what_the_tests_of_recovery_type_has_the_numbers_of_every_layout():
    numbers, typed = numbers_of_layouts(), layouts_typed()
    newest = {machine: numbers[version, machine][0] for version, machine in numbers if version == "8"}
    for (version, machine), (_, data) in numbers.items():
        # Built-in storage has the same numbers twice; there, partitions are where they were.
        rows = typed.get(("8" if machine == "built-in storage" else version, machine), set())
        # Every run wipes it, so that partition 3 is never alone.
        assert (1 in rows) == ((version, machine) != ("1", "RAID")), f"row 1, layout {version}, {machine}: {rows}"
        assert (3 in rows) == (data < newest[machine]), f"row 3, layout {version}, {machine}: {rows}"
        assert rows & {2, 3}, f"row 2 or 3, layout {version}, {machine}: {rows}"


def case_recovery_looks_where_data_begins_in_any_layout():
    numbers = numbers_of_layouts()
    gap = {machine: data - end for (version, machine), (end, data) in numbers.items() if version == "8"}
    expected = {data for _, data in numbers.values()}
    expected |= {end + gap[machine] for (_, machine), (end, _) in numbers.items()}
    told = re.search(r"^for data in ([\d ]+); do$", read("docs/recovery.md"), re.M).group(1)
    verdict.same([int(number) for number in told.split()], sorted(expected), "docs/recovery.md")


verdict.cases(globals(), "".join(sys.argv[2:3]))
