#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""The docs say what is so: docs.py BUILD_DIR STORY_FOLDER

STORY_FOLDER is what tests/product/run has prepared: the commands that the docs have for the virtual
appliance (commands), and what a run of the demo and of these commands has printed there (story).

    docs.py --appliance-commands prints the commands.
"""
import filecmp
import glob
import json
import os
import re
import subprocess
import sys
import tempfile

sys.path.insert(0, os.path.join(os.path.dirname(__file__), "../support/verdict"))
import verdict  # noqa: E402
from verdict import ROOT, read  # noqa: E402

PROMPT = "appliance# "
ESCAPE = re.compile(r"\x1b\[\d*m")


def run(*command, status=0):
    ended = subprocess.run(command, cwd=ROOT, capture_output=True, text=True, check=False)
    assert ended.returncode == status, f"{command}: {ended.returncode}\n{ended.stdout}{ended.stderr}"
    return ended.stdout


def pages():
    tracked = run("git", "ls-files", "-co", "--exclude-standard", "*.md").split()
    return sorted(path for path in tracked if not path.startswith("tests/"))


def blocks():
    """Indented and fenced lines of all pages: (page, line)."""
    for page in pages():
        before, fenced = "", False
        for line in read(page).split("\n"):
            if line.startswith("```"):
                fenced = not fenced
            elif fenced or (line.startswith("    ") and not before.lstrip().startswith(("-", "1."))):
                yield page, line.strip()
            before = line if line.strip() and not line.startswith("    ") else before if line.strip() else ""


STARTS = ("./", "cmake ", "packaging/", "tests/", "appliance/", "bench/", "docs/pictures/", "build/",
          "DESTDIR=", "mdrequests ", "ln ", "git ", PROMPT)


def commands():
    """What the pages tell people to type, without the words beside it; comments begin at two blanks."""
    found = []
    for page, line in blocks():
        command = re.split(r"\s{2,}", line)[0]
        is_folder = re.match(r"(tests|appliance|bench|docs|packaging|build)/( |$|\S*/$)", command)
        if command.startswith(STARTS) and not is_folder:
            found.append((page, command))
    return found


# --- how each command of the docs is run ---------------------------------------------------------

def by_check(command):
    """The suite runs inside ./check; its words are those that it knows."""
    known = run("./check", "--help")
    for word in command.split()[1:]:
        assert re.search(rf"(^|\s){re.escape(word)}(\s|$)", known), f"./check knows no {word}"


def names_of(kind):
    return [row["name"] for row in json.loads(read("CMakePresets.json"))[kind]]


def suites():
    return re.findall(r"^([\w-]+) \|", read("tests/suites"), re.M)


def by_preset(command):
    """Presets are built by ./check; here they only have to exist, and targets, too."""
    words = command.split()
    if "--preset" in words:
        preset = words[words.index("--preset") + 1]
        kind = "buildPresets" if "--build" in words else "configurePresets"
        assert preset in names_of(kind), f"no {kind} {preset}"
    if "--target" in words:
        target = words[words.index("--target") + 1]
        assert re.search(rf"\b{target}\b", run("cmake", "--build", BUILD, "--target", "help")), target


def by_suite(command):
    """A part of a suite that needs no machine is run; of the others the words are looked at."""
    _, build, suite, *arguments = command.replace("'", "").split()
    assert os.path.basename(build) in names_of("configurePresets"), build
    assert suite in suites(), suite
    if suite in ("unit", "sandbox"):
        assert " 0 failed" in run("tests/run", BUILD, suite, *arguments).strip().split("\n")[-1]


def by_bench(command):
    """The smallest part of it: the figures take a minute each."""
    least = {"growth": ("--gtest_filter=*EnumerationOfDisks", "[  PASSED  ] 1 test."),
             "containers": ("--benchmark_filter=push/list/10$", "push/list/10 ")}
    argument, line = least[os.path.basename(command)]
    assert line in run(command.replace("build/release", BUILD), argument), command


def by_gates(command):
    """The gates are counts of the same run; what it may be asked for stands in its head."""
    program = command.split()[0]
    assert f'"$BENCH_DIR/{os.path.basename(program)}" --counts' in read("bench/gates"), command
    assert f"#   {command} " in read(program), command
    run("bash", "-n", program)


def by_install(command):
    with tempfile.TemporaryDirectory() as folder:
        command = command.replace("build/release", BUILD).replace("/tmp/stage", folder)
        run("sh", "-c", command)
        assert os.path.exists(folder + "/usr/sbin/arrayctl")


def by_options(command):
    """A machine is booted for the story and by the appliance suite; the options are those of the help."""
    program, *words = command.split()
    known = run(program, "--help")
    for word in words:
        assert not word.startswith("--") or word in known, f"{program} knows no {word}"


def by_story(command):
    assert f"== {command[len(PROMPT):]}\n" in STORY, f"{command} was not run"
    outcome = STORY.split(f"== {command[len(PROMPT):]}\n", 1)[1].split("== status ", 1)
    assert outcome[1].startswith("0") and outcome[0].strip(), f"{command}: {outcome}"


def by_installed(command):
    """The platform package's launcher, around the tool, on an array that does not exist."""
    words = command.replace("mdrequests ", f"{BUILD}/platform/mdrequests/mdrequests ")
    words = words.replace(" arrayctl status 0", f" {BUILD}/tool/arrayctl status 4711")
    ended = subprocess.run(["sh", "-c", words], capture_output=True, text=True, check=False)
    assert (ended.stdout, ended.stderr, ended.returncode) == ("RAID /dev/md4711 is not found\n", "", 1), ended


def by_demo(_):
    assert "appliance/run --disks 4 appliance/demo.sh" in read("demo")


def by_install_test(command):
    program = command.split()[0]
    assert program in read("tests/product/install.sh")
    assert command in " ".join(run(program, "--help").split()), f"{program} --help does not have it"


def by_pictures(_):
    assert "case_the_pictures_are_current" in globals()


def by_being_there(command):
    script = command.split()[0] if not command.startswith("ln ") else re.search(r"tests/\S+", command).group(0)
    assert os.access(os.path.join(ROOT, script), os.X_OK), script
    run("bash", "-n", script)


def by_udev(command):
    """The case of udev does it, for each of the rules that it names."""
    case = read("tests/appliance/cases/udev.sh")
    rules = re.search("^RULES='(.*)'$", case, re.M).group(1).split()
    steps = re.findall(r"^ *must (.*)$", case, re.M)
    assert command in [step.replace('"', "").replace("$rule", rule) for step in steps for rule in rules], command


RULES = (
    (r"\./check\b", by_check), (r"\./demo$", by_demo), (r"cmake ", by_preset),
    (r"tests/run ", by_suite), (r"build/release/bench/", by_bench), (r"bench/", by_gates),
    (r"DESTDIR=", by_install), (r"mdrequests ", by_installed),
    (r"appliance/(run|shell)\b", by_options), (re.escape(PROMPT), by_story),
    (r"packaging/make-", by_install_test), (r"docs/pictures/make", by_pictures),
    (r"ln -s /dev/null |udevadm ", by_udev),
    (r"tests/style/before-commit|ln -s .*tests/style/before-commit", by_being_there),
)


def case_every_command_of_the_docs_is_run():
    found = commands()
    assert len(found) >= 25, found
    for page, command in found:
        rule = next((rule for pattern, rule in RULES if re.match(pattern, command)), None)
        assert rule is not None, f"{page}: nothing runs {command!r}"
        try:
            rule(command)
        except AssertionError as wrong:
            raise AssertionError(f"{page}: {command!r}: {wrong}") from wrong


# --- the rest ------------------------------------------------------------------------------------

def case_the_suites_that_are_told_of_exist():
    table = re.search(r"\| suite \|.*?\n\n", read("tests/README.md"), re.S).group(0)
    told = re.findall(r"[\w-]+", " ".join(re.findall(r"^\| ([\w, -]+) \|", table, re.M)[1:]))
    verdict.same(told, suites(), "tests/README.md")
    verdict.same(re.findall(r"^  (\S+)  +", run("./check", "--help"), re.M), [*suites(), "./check"], "./check --help")


def case_links_lead_somewhere():
    for page in pages():
        for target in re.findall(r"\]\(([^)#]+)", read(page)):
            if "://" not in target:
                path = os.path.join(ROOT, os.path.dirname(page), target)
                assert os.path.exists(path), f"{page}: {target}"


def case_named_files_exist():
    """Paths in back quotes that begin with a folder of the tree."""
    folders = "appliance|cmake|docs|lib\\w+|packaging|platform|tests|tool"
    for page in pages():
        for path in re.findall(rf"`((?:{folders})/[^`\s<>]*)`", read(page)):
            assert glob.glob(os.path.join(ROOT, path)), f"{page}: {path}"


def case_the_pictures_are_current():
    with tempfile.TemporaryDirectory() as folder:
        run("docs/pictures/make", "--to", folder)
        made = sorted(os.listdir(folder))
        verdict.same(made, ("demo.svg", "layouts.svg", "modules.svg"), "pictures")
        for name in made:
            current = filecmp.cmp(os.path.join(folder, name), os.path.join(ROOT, "docs/pictures", name), shallow=False)
            assert current, f"docs/pictures/{name} is out of date: run docs/pictures/make"


def case_the_layouts_picture_has_every_row():
    rows = re.search(r"LAYOUTS = \{(.*?)\};", read("libnurostoragecore/lib/partition/partition_layout.cpp"), re.S)
    drawn = re.findall(r'font-weight="bold"[^>]*>(\d+)<', read("docs/pictures/layouts.svg"))
    assert len(drawn) == rows.group(1).count("Row("), drawn


def settled(text):
    """A run without what differs from one to the next: how far a rebuild has come."""
    text = ESCAPE.sub("", text)
    text = re.sub(r"status: \w+, rebuilding: .*", "status", text)
    return re.sub(r"(Normal|Rebuilding)\]", "]", text).strip()


def case_the_picture_of_the_demo_shows_what_a_run_prints():
    shown = settled(read("docs/pictures/demo.txt"))
    ran = settled(STORY.split("\n== ", 1)[0])
    assert ran == shown, f"--- ran\n{ran}\n--- shown\n{shown}"


def case_the_report_in_the_readme_is_a_report_of_the_demo():
    example = re.search(r"A report looks like this:\n\n((?:    .*\n)+)", read("README.md")).group(1)
    lines = [line.strip() for line in example.strip("\n").split("\n")]
    for line in lines[1:4]:
        assert line in read("docs/pictures/demo.txt"), line


if sys.argv[1] == "--appliance-commands":
    print("\n".join(command[len(PROMPT):] for _, command in commands() if command.startswith(PROMPT)))
    sys.exit(0)
BUILD = os.path.abspath(sys.argv[1])
with open(os.path.join(sys.argv[2], "story"), encoding="utf-8") as story:
    STORY = story.read()
verdict.cases(globals(), "".join(sys.argv[3:4]))
