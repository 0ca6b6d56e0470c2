#!/usr/bin/env -S python3 -B
# SPDX-License-Identifier: Apache-2.0
"""Checks that what a page shows is true: compiles, configures, runs or parses every fenced block, and follows its links.

Usage: check_document.py [--broken] ROOT BUILD PROGRAM PAGE...

With --broken each page has to have just the one fault that its first line tells.

The word behind a fence names the language; further words, which readers don't see, choose among these rules:

    cpp            a whole program: compiled, linked, run
    cpp FRAME      a part of one: put into frames/FRAME.frame; run when that has a main
    cmake          the rest of a project with client.cpp: configured against the installed library
    sh             commands: each line runs in a copy of the checkout, on the simulated desktop, and has to succeed
    sh ctrl-c      the same for commands that go on for ever: interrupted after their first output
    sh on-display  the same with the caller's DISPLAY; may stand beside ctrl-c
    json           a debug file: parsed, its keys looked up in docs/configuration.md; lies in the folder from then on
    text output    lines of what the commands before it printed, in order; … stands for anything
    text diagram   a drawing, the only thing that nothing is checked of

`./dev COMMAND` is only looked up in `./dev help`, as these tests are run by one of them; sudo does nothing; ffmpeg,
consumer and the benchmarks have stand-ins.
"""

import json
import os
import pathlib
import re
import shutil
import signal
import subprocess
import sys
import tempfile
import time

HERE = pathlib.Path(__file__).resolve().parent
PATIENCE = 60  # Seconds that a command may take before it counts as hanging.
FENCE = re.compile(r"^\s*```(.*)$")
LINK = re.compile(r"!?\[[^\]]*\]\(([^)\s]+)\)")


class Fault(Exception):
    pass


class Block:
    def __init__(self, line, words):
        self.line = line
        self.language, *self.words = words or [""]
        self.lines = []

    def text(self):
        return "".join(line + "\n" for line in self.lines)


# ---- Reading a page


def read_page(page):
    """Gives the fenced blocks, and the other lines as (number, text)."""
    blocks, prose, block = [], [], None
    for number, line in enumerate(page.read_text(encoding="utf-8").splitlines(), 1):
        fence = FENCE.match(line)
        if fence and block is None:
            block = Block(number, fence.group(1).split())
        elif fence:
            blocks.append(block)
            block = None
        elif block is not None:
            block.lines.append(line)
        else:
            prose.append((number, line))
    if block is not None:
        raise Fault(f"{page}:{block.line}: a fence that nothing closes")
    return blocks, prose


def bare_code(prose):
    """The first line of each block that is set apart by four spaces alone."""
    in_list = after_empty = False
    for number, line in prose:
        if not line.strip():
            after_empty = True
            continue
        if line.startswith("    "):
            if after_empty and not in_list:
                yield number
        else:
            in_list = re.match(r"\s*([-*]|\d+\.)\s", line) is not None or (in_list and line.startswith(" "))
        after_empty = False


def anchors(page):
    for _, line in read_page(page)[1]:
        if line.startswith("#"):
            yield re.sub(r"[^\w\- ]", "", line.lstrip("#").strip().lower()).replace(" ", "-")


def check_links(page, prose):
    for number, line in prose:
        for target in LINK.findall(line):
            path, _, anchor = target.partition("#")
            if re.match(r"[a-z]+:", path):
                continue
            file = page.parent / path if path else page
            if not file.exists():
                yield f"{page}:{number}: the link to {target} leads nowhere"
            elif anchor and anchor not in anchors(file):
                yield f"{page}:{number}: {path or page.name} has no heading for #{anchor}"


# ---- Where blocks run


class Checkout:
    """A folder that looks like a built checkout, and in which commands may write."""

    def __init__(self, root, build, program):
        self.root, self.build = root, build
        self.folder = pathlib.Path(tempfile.mkdtemp())
        self.said = ""
        self._link_sources()
        self._link_programs(program)
        (self.folder / "debug").mkdir(mode=0o700)
        self.environment = {name: value for name, value in os.environ.items()
                            if not name.startswith("SCREENSHARE_") and "DISPLAY" not in name}
        self.environment.update(
            PATH=f"{self.folder / 'bin'}:{os.environ['PATH']}", HOME=str(self.folder), LC_ALL="C", TMPDIR=str(self.folder),
            PKG_CONFIG_PATH=str(self.folder / "prefix/lib/pkgconfig"), SCREENSHARE_PLATFORM="simulated",
            SCREENSHARE_DEBUG_DIR=str(self.folder / "debug"))

    def end(self):
        shutil.rmtree(self.folder)

    def _link_sources(self):
        for entry in self.root.iterdir():
            if entry.name not in ("build", "dev", ".git"):
                (self.folder / entry.name).symlink_to(entry)
        shutil.copy(self.root / "examples/minimal_client/minimal_client.cpp", self.folder / "client.cpp")

    def _link_programs(self, program):
        release = self.folder / "build/release"
        (release / "bench").mkdir(parents=True)
        for name in ("examples", "tools"):
            (release / name).symlink_to(self.build / name)
        for source in (self.root / "bench").glob("*_bench.cpp"):
            self._stand_in(release / "bench" / source.stem, "exit 0")
        bin_folder = self.folder / "bin"
        bin_folder.mkdir()
        (bin_folder / "screenshare").symlink_to(program)
        self._stand_in(bin_folder / "sudo", "exit 0")
        for reader in ("ffmpeg", "consumer"):
            self._stand_in(bin_folder / reader, "head -c 1 >/dev/null; echo reads >&2; exec cat >/dev/null")
        self._stand_in(self.folder / "dev", f"exec grep -q \"^  $1 \" <('{self.root}/dev' help)")

    @staticmethod
    def _stand_in(path, body):
        path.write_text(f"#!/bin/bash\n{body}\n")
        path.chmod(0o755)

    def prefix(self):
        prefix = self.folder / "prefix"
        if not prefix.exists():
            for component in ("library", "development"):
                self.expect(["cmake", "--install", str(self.build), "--prefix", str(prefix), "--component", component])
        return prefix

    def expect(self, command, allowed=(0,), interrupt=False, display=False):
        """Runs a command; gives what it printed. It has to end by itself, or at an interrupt after its first output."""
        environment = dict(self.environment)
        if display:
            environment.update({name: os.environ[name] for name in ("DISPLAY", "XAUTHORITY") if name in os.environ})
        with tempfile.TemporaryFile("w+", dir=self.folder, encoding="utf-8", errors="replace") as output:
            child = subprocess.Popen(command, cwd=self.folder, env=environment, start_new_session=True,
                                     stdin=subprocess.DEVNULL, stdout=output, stderr=subprocess.STDOUT)
            ended = self._wait(child, output, interrupt)
            output.seek(0)
            said = output.read()
        if ended not in allowed:
            told = "does not end" if ended is None else f"ends with {ended}"
            raise Fault(f"{' '.join(command)}: {told}\n{said}")
        return said

    @staticmethod
    def _wait(child, output, interrupt):
        deadline = time.monotonic() + PATIENCE
        try:
            if interrupt:
                while child.poll() is None and os.fstat(output.fileno()).st_size == 0:
                    if time.monotonic() > deadline:
                        return None
                    time.sleep(0.02)
                if child.poll() is None:
                    os.killpg(child.pid, signal.SIGINT)
            return child.wait(max(0.1, deadline - time.monotonic()))
        except subprocess.TimeoutExpired:
            return None
        finally:
            if child.poll() is None:
                os.killpg(child.pid, signal.SIGKILL)
                child.wait()


# ---- Rules


def framed(block):
    """The block as a source file, with the options that its frame asks for."""
    if not block.words:
        return block.text(), ["-std=c++14"]
    frame = HERE / "frames" / f"{block.words[0]}.frame"
    if not frame.exists():
        raise Fault(f"there is no frame {block.words[0]}")
    text = frame.read_text(encoding="utf-8")
    options = re.search(r"^// Options: (.*)$", text, re.MULTILINE)
    return text.replace("// BLOCK\n", block.text()), options.group(1).split() if options else ["-std=c++14"]


def check_cpp(block, checkout):
    text, options = framed(block)
    source, program = checkout.folder / "block.cpp", checkout.folder / "block"
    source.write_text(text, encoding="utf-8")
    compiler = [os.environ.get("CXX", "g++"), "-Wall", "-Wextra", "-Werror", "-Wno-unused", *options,
                "-Iinclude", str(source)]
    if "int main(" not in text:
        checkout.expect([*compiler, "-fsyntax-only"])
        return
    library = checkout.prefix() / "lib"
    checkout.expect([*compiler, f"-L{library}", "-lscreenshare", f"-Wl,-rpath,{library}", "-pthread", "-o", str(program)])
    checkout.said = checkout.expect([str(program)])


def check_cmake(block, checkout):
    project = checkout.folder / "project"
    shutil.rmtree(project, ignore_errors=True)
    project.mkdir()
    shutil.copy(checkout.folder / "client.cpp", project)
    (project / "CMakeLists.txt").write_text(
        "cmake_minimum_required(VERSION 3.20)\nproject(client CXX)\nadd_executable(client client.cpp)\n" + block.text())
    checkout.expect(["cmake", "-S", str(project), "-B", str(project / "build"),
                     f"-DCMAKE_PREFIX_PATH={checkout.prefix()}"])


def check_sh(block, checkout):
    unknown = set(block.words) - {"ctrl-c", "on-display"}
    if unknown:
        raise Fault(f"no rule for commands is called {', '.join(unknown)}")
    interrupt, said = "ctrl-c" in block.words, []
    for command in block.text().replace("\\\n", " ").splitlines():
        if not command.split("#")[0].strip():
            continue
        if "pkg-config" in command:
            checkout.prefix()
        # Programs in a pipe that don't know better are ended by the interrupt, and so is their shell.
        allowed = (0, 128 + signal.SIGINT, -signal.SIGINT) if interrupt and "|" in command else (0,)
        said.append(checkout.expect(["bash", "-c", "set -o pipefail; " + command], allowed, interrupt,
                                    "on-display" in block.words))
    checkout.said = "".join(said)


def check_json(block, checkout):
    try:
        keys = set(json.loads(block.text()))
    except ValueError as error:
        raise Fault(f"no JSON: {error}") from error
    page = (checkout.root / "docs/configuration.md").read_text(encoding="utf-8")
    unknown = keys - set(re.findall(r"^\| `(\w+)`", page, re.MULTILINE))
    if unknown:
        raise Fault(f"the debug file knows no {', '.join(sorted(unknown))}")
    (checkout.folder / "share_config.json").write_text(block.text(), encoding="utf-8")


def check_text(block, checkout):
    if block.words == ["diagram"]:
        return
    if block.words != ["output"]:
        raise Fault("what kind of text is this: output or diagram?")
    said = iter(checkout.said.splitlines())
    for line in block.lines:
        pattern = ".*".join(re.escape(part) for part in " ".join(line.split()).split("…"))
        if not any(re.fullmatch(pattern, " ".join(each.split())) for each in said):
            raise Fault(f"the commands before it did not print\n    {line}\nbut\n{checkout.said}")


RULES = {"cpp": check_cpp, "cmake": check_cmake, "sh": check_sh, "json": check_json, "text": check_text}


def check_page(page, checkout):
    blocks, prose = read_page(page)
    yield from check_links(page, prose)
    for number in bare_code(prose):
        yield f"{page}:{number}: code without a fence"
    for block in blocks:
        try:
            if block.language not in RULES:
                raise Fault(f"no rule for the language '{block.language}'")
            RULES[block.language](block, checkout)
        except Fault as fault:
            yield f"{page}:{block.line}: {fault}"
    print(f"{page}: {len(blocks)} blocks")


def check_pages(pages, checkout):
    for page in pages:
        try:
            yield from check_page(page, checkout)
        except Fault as fault:
            yield str(fault)


def missed_faults(pages, checkout):
    """Of pages that tell their one fault in the first line, those of which another one is found, or none."""
    for page in pages:
        expected = re.match(r"<!-- (.*) -->", page.read_text(encoding="utf-8")).group(1)
        found = list(check_pages([page], checkout))
        if len(found) != 1 or expected not in found[0]:
            yield f"{page}: instead of '{expected}' there is {found}"


def main():
    expects_faults = sys.argv[1] == "--broken"
    if expects_faults:
        del sys.argv[1]
    root, build, program, *pages = (pathlib.Path(argument).resolve() for argument in sys.argv[1:])
    checkout = Checkout(root, build, program)
    try:
        faults = list((missed_faults if expects_faults else check_pages)(pages, checkout))
    finally:
        checkout.end()
    for fault in faults:
        print(f"FAILED: {fault}")
    return 1 if faults or not pages else 0


if __name__ == "__main__":
    sys.exit(main())
