# SPDX-License-Identifier: MIT
"""What every suite shares: how an outcome is told, how workers run, and when something hangs.

An outcome is one line, "ok NAME" or "FAILED NAME", the latter with what is wrong indented below it;
behind " # " a line may have a remark that is no part of the name. A line of any other form is a sign
of life. Nobody but tests/run counts outcomes.
"""
import concurrent.futures
import fnmatch
import os
import re
import select
import signal
import subprocess
import sys
import threading
import time
import traceback

ROOT = os.path.abspath(os.path.join(os.path.dirname(__file__), "../../.."))
WORKERS = os.cpu_count() or 1
NOTE = " # "
GRACE_SECONDS = 10  # for what is ended to clean up behind itself
lock = threading.Lock()


def read(path):
    """The text of a file of the tree."""
    with open(os.path.join(ROOT, path), encoding="utf-8") as file:
        return file.read()


def silence(times=1):
    """Seconds; see silence.sh."""
    text = read("tests/support/verdict/silence.sh")
    number = re.search(r"^SILENCE_SECONDS=\$\{ARRAYCTL_SILENCE:-(\d+)\}$", text, re.M).group(1)
    return times * float(os.environ.get("ARRAYCTL_SILENCE") or number)


def say(text):
    with lock:
        print(text, flush=True)


def tell(name, wrong=None, note=""):
    """The outcome of one test: passed when nothing is wrong. Returns whether it passed."""
    lines = "".join(f"\n    {line}" for line in (wrong or "").rstrip("\n").split("\n") if wrong)
    say(("ok " if wrong is None else "FAILED ") + name + (NOTE + note if note else "") + lines)
    return wrong is None


def alive(what):
    """A sign of life, not more often than it is needed, of something whose output is kept for later."""
    if time.monotonic() - alive.told > silence() / 10:
        alive.told = time.monotonic()
        say(f"... {what}")


alive.told = time.monotonic()


def wanted(name, pattern):
    """A filter is a pattern as of files, or a part of the name; none takes everything."""
    return not pattern or pattern in name or fnmatch.fnmatchcase(name, pattern)


def cases(functions, pattern=""):
    """Runs those functions of a module whose names begin with "case_"; each of them asserts."""
    for function, case in list(functions.items()):
        name = function[len("case_"):].replace("_", " ")
        if not function.startswith("case_") or not wanted(name, pattern):
            continue
        try:
            case()
            tell(name)
        except Exception:  # a case that breaks has failed, and the others still run
            tell(name, traceback.format_exc())


def same(found, expected, what):
    """Both as sets of words, so that the message tells what is missing and what is too much."""
    found, expected = set(found), set(expected)
    assert found == expected, f"{what}: missing {sorted(expected - found)}, too much {sorted(found - expected)}"


def each(function, items, workers=WORKERS):
    """The function of every item, some at a time; the results in the order of the items."""
    with concurrent.futures.ThreadPoolExecutor(workers) as pool:
        return list(pool.map(function, items))


# --- programs that are watched -------------------------------------------------------------------


def end_group(process):
    for number in (signal.SIGTERM, signal.SIGKILL):
        try:
            os.killpg(process.pid, number)
        except ProcessLookupError:
            break
        try:
            process.wait(GRACE_SECONDS)
        except subprocess.TimeoutExpired:
            continue
    process.wait()


def lines_of(process, seconds):
    """What the program prints, line by line until it ends, without what it leaves behind. Raises
    TimeoutError when it is silent for too long."""
    ended = os.pidfd_open(process.pid)
    text = b""
    try:
        while True:
            ready = select.select([process.stdout, ended], [], [], seconds)[0]
            if not ready:
                raise TimeoutError
            data = os.read(process.stdout.fileno(), 65536) if process.stdout in ready else b""
            *lines, text = (text + data).split(b"\n")
            yield from (line.decode("utf-8", "replace") for line in lines)
            if not data and (ended in ready or process.stdout in ready):
                break
        if text:
            yield text.decode("utf-8", "replace")
    finally:
        os.close(ended)


def watch(command, take, times, **options):
    """Runs a program and hands every line of its output to take. Returns None when it ended well,
    otherwise how it ended. The silence that it may keep is the common one, some times."""
    with subprocess.Popen(command, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, stdin=subprocess.DEVNULL,
                          start_new_session=True, **options) as process:
        try:
            for line in lines_of(process, silence(times)):
                take(line)
            status = process.wait()
        except TimeoutError:
            return f"it hangs: silent for {silence(times):.0f} s"
        finally:
            end_group(process)
    if status < 0:
        return f"it ended by signal {signal.Signals(-status).name}"
    return f"it ended with status {status}" if status else None


def end_on_signals():
    """A run that is ended ends what it has started: through the finally of watch."""
    for number in (signal.SIGTERM, signal.SIGHUP, signal.SIGINT):
        signal.signal(number, lambda number, frame: sys.exit(128 + number))


# --- GoogleTest ----------------------------------------------------------------------------------

RUNS = re.compile(r"^\[ RUN      \] (\S+)$")
ENDED = re.compile(r"^(.*)\[ (      OK| FAILED ) \] (\S+?)(?:, where .*)? \(\d+ ms\)$")


def googletest(command, pattern="", prefix="", shards=1, parts=1, **options):
    """Runs a GoogleTest program in so many parts side by side and tells the outcome of each of its
    tests, with a prefix before the name. Of so many parts of all tests one is run. A pattern is one of
    GoogleTest's."""
    environment = dict(options.pop("env", os.environ), GTEST_TOTAL_SHARDS=str(shards * parts))

    def shard(index):
        running, said = None, []

        def take(line):
            nonlocal running, said
            alive(running or "")
            begun, ended = RUNS.match(line), ENDED.match(line)
            if begun:
                running, said = begun.group(1), []
            elif ended:
                said.append(ended.group(1))
                wrong = "\n".join(said).strip("\n") if ended.group(2) == " FAILED " else None
                good[index] = tell(prefix + ended.group(3), wrong) and good[index]
                running, said = None, []
            else:
                said.append(line)

        wrong = watch([*command, f"--gtest_filter={pattern}" if pattern else "--gtest_filter=*"], take, 2,
                      env=dict(environment, GTEST_SHARD_INDEX=str(index)), **options)
        if wrong is not None and (running is not None or good[index]):
            tell(prefix + (running or os.path.basename(command[-1])), "\n".join([wrong, *said]))

    good = [True] * shards
    each(shard, range(shards), shards)
