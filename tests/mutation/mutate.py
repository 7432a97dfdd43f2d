#!/usr/bin/env python3
"""Puts small faults into src/, one at a time, and lists those that no test notices.

Each worker has a copy of the tree: build/mutation/0 and so on. A fault is tried by the unit tests of
its source, then by all unit tests, then by the quick process tests and example tests. The first test
that fails or times out has caught it. Faults that do not compile are not counted. Faults that change
nothing a test could see are listed, with the reason, in tests/mutation/accepted.txt.
"""

import argparse
import collections
import ctypes
import json
import multiprocessing
import os
import queue
import re
import resource
import shutil
import signal
import subprocess
import sys
import tempfile
import time
from pathlib import Path

sys.dont_write_bytecode = True  # the tree stays as it is
import faults  # noqa: E402

ROOT = Path(__file__).resolve().parents[2]
WORK = ROOT / "build" / "mutation"
ACCEPTED = ROOT / "tests" / "mutation" / "accepted.txt"
NOBODY = 65534
CHUNK = 10  # faults that a worker takes at once
SHARDS = 2  # processes of one test run
PROGRAMS = ["unit_tests", "process_tests", "example_tests"]
QUICK_SECONDS = 1.0  # slower process tests and example tests are not run here
FOLDERS = ["cmake", "docs", "examples", "include", "platform", "src", "tests"]
MIB = 1 << 20
PR_SET_CHILD_SUBREAPER = 36


Result = collections.namedtuple("Result", "source line before after caught_by")


def become_subreaper():
    """Orphaned descendants become children of this process."""
    ctypes.CDLL(None).prctl(PR_SET_CHILD_SUBREAPER, 1, 0, 0, 0)


def descendants():
    """All descendants of this process, orphans included."""
    parents = {}
    for stat in Path("/proc").glob("[0-9]*/stat"):
        try:
            fields = stat.read_text().rpartition(")")[2].split()
        except OSError:
            continue
        parents.setdefault(int(fields[1]), []).append(int(stat.parent.name))
    found = [os.getpid()]
    for pid in found:
        found += parents.get(pid, [])
    return found[1:]


def end_descendants():
    """A faulty child may have left its process group, but it remains our descendant."""
    while pids := descendants():
        for pid in pids:
            try:
                os.kill(pid, signal.SIGKILL)
            except ProcessLookupError:
                pass
        try:
            os.waitpid(-1, 0)
        except ChildProcessError:
            pass


def set_limits():
    """A faulty program must not use up the machine or run forever."""
    resource.setrlimit(resource.RLIMIT_CPU, (300, 300))
    resource.setrlimit(resource.RLIMIT_AS, (4096 * MIB, 4096 * MIB))
    resource.setrlimit(resource.RLIMIT_FSIZE, (1024 * MIB, 1024 * MIB))
    resource.setrlimit(resource.RLIMIT_CORE, (0, 0))
    resource.setrlimit(resource.RLIMIT_NPROC, (4096, 4096))


class Tests:
    """Some tests of one program, run by `SHARDS` processes."""

    def __init__(self, name, program, chosen, seconds):
        self.name = name
        self.program = program
        self.chosen = chosen
        self.limit = 5 * seconds + 20

    def fail_in(self, build):
        """Their name or "time-out" if they fail; an empty text if they pass."""
        # Not as root and in a directory of their own: a fault may remove the wrong path.
        scratch = tempfile.mkdtemp(prefix="orvadr-mutation-")
        os.chmod(scratch, 0o777)
        try:
            return self.outcome([self.start(build, scratch, shard) for shard in range(SHARDS)])
        finally:
            end_descendants()
            shutil.rmtree(scratch, ignore_errors=True)

    def start(self, build, scratch, shard):
        rights = dict(user=NOBODY, group=NOBODY, extra_groups=[]) if os.geteuid() == 0 else {}
        environment = dict(os.environ, TMPDIR=scratch, HOME=scratch, GTEST_FILTER=self.chosen,
                           GTEST_TOTAL_SHARDS=str(SHARDS), GTEST_SHARD_INDEX=str(shard))
        with open(build.with_name(f"tests-{shard}.log"), "wb") as log:
            return subprocess.Popen(
                [build / "tests" / self.program, "--gtest_fail_fast"], cwd=scratch, env=environment,
                stdin=subprocess.DEVNULL, stdout=log, stderr=log, start_new_session=True,
                preexec_fn=set_limits, **rights)

    def outcome(self, started):
        end = time.monotonic() + self.limit
        while time.monotonic() < end:
            codes = [process.poll() for process in started]
            if any(codes):
                return self.name
            if None not in codes:
                return ""
            time.sleep(0.01)
        return "time-out"


class Copy:
    """A copy of the tree, into which faults are put, and its build."""

    def __init__(self, number):
        self.tree = WORK / str(number) / "tree"
        self.build = WORK / str(number) / "build"

    def update(self):
        tops = [ROOT / "CMakeLists.txt"] + [ROOT / name for name in FOLDERS]
        files = [path for top in tops for path in [top, *top.rglob("*")] if path.is_file()]
        wanted = {self.tree / path.relative_to(ROOT): path for path in files}
        for path in self.tree.rglob("*"):
            if path.is_file() and path not in wanted:
                path.unlink()
        for path, source in wanted.items():
            content = source.read_bytes()
            if not path.exists() or path.read_bytes() != content:
                path.parent.mkdir(parents=True, exist_ok=True)
                path.write_bytes(content)
                shutil.copymode(source, path)

    def prepare(self):
        self.update()
        if not (self.command("cmake", "-S", self.tree, "-B", self.build,
                             "-DCMAKE_BUILD_TYPE=Debug", "-DCMAKE_CXX_FLAGS_DEBUG=-O0 -w",
                             "-DORVADR_PRECOMPILE=ON")
                and self.make(*PROGRAMS)):
            sys.exit(f"error: the build fails without a fault; see {self.build}.log")

    def make(self, *targets):
        return self.command("cmake", "--build", self.build, "--target", *targets)

    def command(self, *command):
        with open(self.build.with_suffix(".log"), "wb") as log:
            return subprocess.run(command, stdin=subprocess.DEVNULL, stdout=log, stderr=log,
                                  check=False).returncode == 0

    def meet(self, source, text, fault, stages):
        """What catches the fault: "" if nothing does, None if it does not compile."""
        (self.tree / source).write_text(fault.apply(text))
        for tests in stages:
            if not self.make(tests.program):
                return None
            if outcome := tests.fail_in(self.build):
                return outcome
        return ""


def durations(build, program):
    """The seconds that each test takes. All must pass without a fault."""
    if Tests(program, program, "*", 120).fail_in(build):
        sys.exit(f"error: {program} fail without a fault; see {build.parent}/tests-*.log")
    output = "".join(log.read_text(errors="replace") for log in build.parent.glob("tests-*.log"))
    found = re.findall(r"\[       OK \] ([^\s,]+)[^\n]* \((\d+) ms\)$", output, re.M)
    return {name: int(milliseconds) / 1000 for name, milliseconds in found}


def suites_of(source):
    """The suites of a source's own tests: those of NAME_test.cpp and of NAME_..._test.cpp."""
    files = (ROOT / "tests" / "unit").rglob(f"{Path(source).stem}_*test.cpp")
    return {suite for file in files
            for suite in re.findall(r"^(?:TYPED_)?TEST(?:_[FP])?\((\w+),", file.read_text(), re.M)}


def stages_of(source, seconds):
    """The tests that try a fault of this source, in this order."""
    suites = suites_of(source)
    unit = seconds["unit_tests"]
    own = {name: took for name, took in unit.items() if suites & set(re.split("[./]", name))}
    if own:
        yield Tests("own tests", "unit_tests", ":".join(own), sum(own.values()))
    yield Tests("unit tests", "unit_tests", "*", sum(unit.values()))
    for program in PROGRAMS[1:]:
        quick = {name: took for name, took in seconds[program].items() if took <= QUICK_SECONDS}
        yield Tests(program.replace("_", " "), program, ":".join(quick), sum(quick.values()))


def shares(count, sizes):
    """Divides `count` in proportion to the sizes. Each gets at least one."""
    whole = sum(sizes.values())
    return {name: max(1, round(count * size / whole)) for name, size in sizes.items()}


def plan(arguments):
    """The jobs of the workers: a source, some of its faults, and how many of these to try."""
    chosen = arguments.sources or sorted(
        str(path.relative_to(ROOT)) for path in (ROOT / "src").rglob("*.[ch]*"))
    found = {source: faults.find((ROOT / source).read_text(), f"{arguments.seed} {source}")
             for source in chosen}
    found = {source: some for source, some in found.items() if some}
    jobs = []
    wanted = shares(arguments.count, {source: len(some) for source, some in found.items()})
    for source, some in found.items():
        parts = -(-wanted[source] // CHUNK)
        quota = -(-wanted[source] // parts)
        jobs += [(source, some[part::parts], min(quota, wanted[source] - part * quota))
                 for part in range(parts)]
    return jobs


def known(path):
    """The faults that an earlier run caught."""
    if not path.exists():
        return {}
    results = [Result(*json.loads(line)) for line in path.read_text().splitlines()]
    return {(result.source, result.line, result.before, result.after): result.caught_by
            for result in results if result.caught_by != ""}


def work(number, jobs, results, seconds, caught_before):
    become_subreaper()
    copy = Copy(number)
    copy.prepare()
    while (job := jobs.get()) is not None:
        source, some, quota = job
        text = (ROOT / source).read_text()
        stages = list(stages_of(source, seconds))
        for fault in some:
            if quota == 0:
                break
            key = (source, fault.line(text), *fault.change(text))
            outcome = caught_before.get(key, "")
            if outcome == "":
                outcome = copy.meet(source, text, fault, stages)
            quota -= outcome is not None
            results.put(Result(*key, outcome))
        (copy.tree / source).write_text(text)
    results.put(None)


def run(arguments, seconds):
    """Tries the faults. Returns those that compile, each with what caught it."""
    record = WORK / "results.jsonl"
    caught_before = known(record) if arguments.resume else {}
    jobs, results = multiprocessing.Queue(), multiprocessing.Queue()
    planned = plan(arguments)
    for job in planned + [None] * arguments.jobs:
        jobs.put(job)
    workers = [multiprocessing.Process(target=work, args=(number, jobs, results, seconds,
                                                          caught_before))
               for number in range(arguments.jobs)]
    for worker in workers:
        worker.start()
    total = sum(job[2] for job in planned)
    found = []
    with open(record, "a" if arguments.resume else "w", encoding="utf-8") as log:
        while any(worker.is_alive() for worker in workers) or not results.empty():
            try:
                result = results.get(timeout=1)
            except queue.Empty:
                continue
            if result is None:
                continue
            print(json.dumps(result), file=log, flush=True)
            if result.caught_by is not None:
                found.append(result)
                print(f"{len(found)}/{total} {result.source}:{result.line}: "
                      f"{result.caught_by or 'survives'}", flush=True)
    if any(worker.exitcode != 0 for worker in workers):
        sys.exit("error: a worker failed")
    return found


def accepted_faults():
    """Reads blocks of lines: "src/NAME", "- BEFORE", "+ AFTER", then the indented reason."""
    block = re.compile(r"^(src/\S+)\n- (.*)\n\+ (.*)\n((?:  .*\n)+)", re.M)
    found = {match.group(1, 2, 3): " ".join(match.group(4).split())
             for match in block.finditer(ACCEPTED.read_text())}
    for source, before, _ in found:
        if before not in " ".join((ROOT / source).read_text().split()):
            sys.exit(f"error: {ACCEPTED}: {source} no longer has this line: {before}")
    return found


def report(found, accepted):
    """Prints the table and the survivors. Returns the percentage that was caught."""
    rows = collections.defaultdict(collections.Counter)
    survivors = []
    for result in found:
        state = "caught"
        if result.caught_by == "":
            key = (result.source, result.before, result.after)
            state = "accepted" if key in accepted else "survived"
            survivors.append((result, accepted.get(key)))
        rows[result.source][state] += 1
        rows["all"][state] += 1
    print(f"\n{'source':30}{'caught':>9}{'survived':>9}{'accepted':>9}{'score':>9}")
    for source in sorted(rows, key=lambda source: (source == "all", source)):
        row = rows[source]
        score = 100 * row["caught"] / max(1, row["caught"] + row["survived"])
        print(f"{source:30}{row['caught']:9}{row['survived']:9}{row['accepted']:9}{score:8.1f}%")
    for result, reason in survivors:
        print(f"\n{result.source}:{result.line}: {'accepted' if reason else 'survived'}\n"
              f"- {result.before}\n+ {result.after}" + (f"\n  {reason}" if reason else ""))
    means = collections.Counter(result.caught_by for result in found if result.caught_by)
    print("\ncaught by", ", ".join(f"{name}: {count}" for name, count in means.most_common()))
    return score


def main():
    parser = argparse.ArgumentParser(description=__doc__,
                                     formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--count", type=int, default=300, help="how many faults (300)")
    parser.add_argument("--seed", type=int, default=1, help="which faults (1)")
    parser.add_argument("--jobs", type=int, default=os.cpu_count(), help="how many workers")
    parser.add_argument("--minimum", type=float, default=95, help="percent to be caught (95)")
    parser.add_argument("--resume", action="store_true",
                        help="continue a run that was stopped; try survivors again")
    parser.add_argument("sources", nargs="*", help="such as src/common/utils.cpp; all without")
    arguments = parser.parse_args()

    begin = time.monotonic()
    accepted = accepted_faults()
    become_subreaper()
    WORK.mkdir(parents=True, exist_ok=True)
    first = Copy(0)
    first.prepare()
    seconds = {program: durations(first.build, program) for program in PROGRAMS}
    score = report(run(arguments, seconds), accepted)
    print(f"seed {arguments.seed}, {time.monotonic() - begin:.0f} s: {score:.1f} %")
    sys.exit(score < arguments.minimum)


if __name__ == "__main__":
    main()
