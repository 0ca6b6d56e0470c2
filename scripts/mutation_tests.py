# SPDX-License-Identifier: Apache-2.0
"""Runs test programs as often as scripts/mutate needs it: quickly, and so that chance doesn't pass for a failure."""

import concurrent.futures
import hashlib
import json
import os
import pathlib
import re
import shutil
import signal
import subprocess
import tempfile
import threading
import time
from typing import NamedTuple

HANG_SECONDS = 20  # Less than tests wait for somebody; on top comes ten times what it took without a change.
LEARN_SECONDS = 120
QUICK_SECONDS = 0.5  # Cases that take no longer share a process: it takes longer to start than most of them.
CASES_TOGETHER = 25
FAULTS = ("fails", "hangs")


def end_session(leader):
    """Kills all that a process has started, wherever it put its groups."""
    for _ in range(500):  # It takes a moment to end, and may have started something in between.
        members = [int(folder.name) for folder in pathlib.Path("/proc").glob("[0-9]*") if session_of(folder) == leader]
        for member in members:
            try:
                os.kill(member, signal.SIGKILL)
            except ProcessLookupError:
                pass
        if not members:
            return
        time.sleep(0.01)


def session_of(folder):
    """The session of a process that runs, by its folder in /proc."""
    try:
        state, _, _, session = (folder / "stat").read_text(errors="replace").rpartition(")")[2].split()[:4]
    except OSError:
        return None
    return int(session) if state != "Z" else None


def run_within(command, seconds, stop=None, **options):
    """The exit status, or None when time or patience ended. Nothing that the command started outlives it."""
    child = subprocess.Popen(command, stdin=subprocess.DEVNULL, stderr=subprocess.STDOUT, start_new_session=True, **options)
    deadline = time.monotonic() + seconds
    try:
        while time.monotonic() < deadline and not (stop and stop.is_set()):
            try:
                return child.wait(0.2)
            except subprocess.TimeoutExpired:
                pass
        return None
    finally:
        end_session(child.pid)
        child.wait()


class Program(NamedTuple):
    name: str
    label: str


class Failure(NamedTuple):
    case: str
    how: str


class Batch(NamedTuple):
    """Cases that run in one process, and how long that takes without a change."""
    program: Program
    cases: tuple
    seconds: float


class Outcome(NamedTuple):
    verdict: str  # passes, fails, hangs, or stopped before it was known
    suspect: str  # the case that was at fault
    seconds: float


class Tests:
    """Runs the cases of test programs as CTest does, in a debug folder of their own, but many in a process."""

    def __init__(self, folder, launcher, jobs, memory):
        self.folder, self.launcher, self.memory = folder, launcher, memory
        self.together = 2 * jobs  # Many a case waits more than it computes.
        self.seconds, self.batches = {}, {}  # Of each program, without a change.
        self.left_out, self.unsteady = [], []
        self.environment = {name: value for name, value in os.environ.items() if not name.startswith("SCREENSHARE_")}
        self.environment.update(SCREENSHARE_TEST_EFFORT="1", GTEST_FAIL_FAST="1")

    def programs(self):
        """Of those that are built, the ones that src/ is linked into."""
        for line in (self.folder / "programs.txt").read_text().splitlines():
            name, label, layer = line.split()
            if layer == "screenshare_core":
                yield Program(name, label)

    def measure(self, program):
        """Of the program without a change. What was measured of the same program earlier still counts."""
        digest = hashlib.sha256((self.folder / program.name).read_bytes()).hexdigest()
        measured = json.loads(self.memory.read_text()) if self.memory.exists() else {}
        if measured.get(program.name, {}).get("program") != digest:
            measured[program.name] = {"program": digest, **self._measured(program)}
            self.memory.write_text(json.dumps(measured, indent=1) + "\n")
        found = measured[program.name]
        self.left_out += [f"{program.name} {case}" for case in found["leftOut"]]
        self.seconds.update({(program, case): seconds for case, seconds in found["seconds"].items()})
        self.batches[program] = [Batch(program, tuple(cases), seconds) for cases, seconds in found["batches"]]

    def _measured(self, program):
        """What fails anyway tells nothing later."""
        singles = [Batch(program, (case,), 0) for case in self._cases(program)]
        outcomes = self._run_all(singles)
        doubtful = [batch for batch, outcome in outcomes if outcome.verdict != "passes"]
        outcomes += self._run_all(doubtful)
        passing = [batch._replace(seconds=outcome.seconds) for batch, outcome in outcomes if outcome.verdict == "passes"]
        seconds = {batch.cases[0]: batch.seconds for batch in passing}
        self.unsteady += [f"{program.name} {batch.cases[0]}" for batch in doubtful if batch.cases[0] in seconds]
        return {"seconds": seconds, "leftOut": [batch.cases[0] for batch in doubtful if batch.cases[0] not in seconds],
                "batches": [(batch.cases, batch.seconds) for batch in self._in_batches(passing)]}

    def is_measured(self, program):
        return program in self.batches

    def first_failure(self, programs, longest):
        """Of cases that take no longer than that. What fails fails twice, or it does so by chance."""
        batches = [batch for program in programs for batch in self.batches[program]
                   if batch.seconds / len(batch.cases) <= longest]
        batches.sort(key=lambda batch: batch.seconds)
        stop, confirming, failures = threading.Event(), threading.Lock(), []

        def run(batch):
            outcome = self._run_once(batch, self._limit(batch), stop)
            if outcome.verdict not in FAULTS:
                return
            with confirming:
                failure = self._confirmed(batch, outcome, stop)
                if failure:
                    failures.append(failure)
                    stop.set()

        self._in_pool(run, batches, stop)
        return failures[0] if failures else None

    def _confirmed(self, batch, outcome, stop):
        for case in sorted(batch.cases, key=lambda case: case != outcome.suspect):
            alone = Batch(batch.program, (case,), self.seconds[batch.program, case])
            failed = case == outcome.suspect
            verdict = self._run_once(alone, self._limit(alone), stop).verdict
            if verdict in FAULTS and not failed:
                failed = True
                verdict = self._run_once(alone, self._limit(alone), stop).verdict
            if verdict in FAULTS:
                return Failure(case, verdict)
            if failed and verdict == "passes":
                self.unsteady.append(f"{batch.program.name} {case}")
        return None

    def _cases(self, program):
        listed = subprocess.run([self.folder / program.name, "--gtest_list_tests"], capture_output=True, text=True,
                                check=True, cwd=self.folder, env=self.environment)
        suite = ""
        for line in listed.stdout.splitlines():
            name = line.split("#")[0].strip()
            if not line.startswith(" "):
                suite = name
            elif not (suite + name).startswith("DISABLED_") and ".DISABLED_" not in suite + name:
                yield suite + name

    def _in_batches(self, singles):
        """Cases that don't get along in one process stay alone."""
        quick = [batch for batch in singles if batch.seconds <= QUICK_SECONDS]
        batches = [batch for batch in singles if batch.seconds > QUICK_SECONDS]
        groups = [quick[begin:begin + CASES_TOGETHER] for begin in range(0, len(quick), CASES_TOGETHER)]
        joined = [Batch(group[0].program, tuple(batch.cases[0] for batch in group), 0) for group in groups]
        for group, (batch, outcome) in zip(groups, self._run_all(joined)):
            batches += [batch._replace(seconds=outcome.seconds)] if outcome.verdict == "passes" else group
        return batches

    @staticmethod
    def _limit(batch):
        return HANG_SECONDS + 10 * batch.seconds

    def _run_all(self, batches):
        """Without a change. Gives (batch, outcome) of each, in their order."""
        stop = threading.Event()
        outcomes = self._in_pool(lambda batch: self._run_once(batch, LEARN_SECONDS, stop), batches, stop)
        return list(zip(batches, outcomes))

    def _in_pool(self, run, batches, stop):
        with concurrent.futures.ThreadPoolExecutor(self.together) as pool:
            try:
                outcomes = list(pool.map(run, batches))
            finally:
                stop.set()
        shutil.rmtree(self.folder / "debug", ignore_errors=True)
        return outcomes

    def _run_once(self, batch, limit, stop):
        if stop.is_set():
            return Outcome("stopped", "", 0)
        start = time.monotonic()
        with tempfile.TemporaryFile("w+", errors="replace") as output:
            status = run_within([self.launcher, f"./{batch.program.name}", f"--gtest_filter={':'.join(batch.cases)}"],
                                limit, stop, cwd=self.folder, env=self.environment, stdout=output)
            seconds = time.monotonic() - start
            if status == 0:
                return Outcome("passes", "", seconds)
            if status is None and stop.is_set():
                return Outcome("stopped", "", seconds)
            output.seek(0)
            return Outcome("hangs" if status is None else "fails", suspect(batch, output), seconds)


def suspect(batch, output):
    """The case that failed, or the one that began last."""
    began = batch.cases[0]
    for line in output:
        found = re.match(r"\[ +(RUN|FAILED) +\] ([^\s,]+)", line)
        if found and found.group(2) in batch.cases:
            began = found.group(2)
            if found.group(1) == "FAILED":
                break
    return began
