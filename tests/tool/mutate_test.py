#!/usr/bin/env -S python3 -B
# SPDX-License-Identifier: Apache-2.0
"""What scripts/mutate changes in a source and what not, and what it makes of tests that fail, hang, or do so by chance."""

import argparse
import collections
import importlib.machinery
import importlib.util
import math
import os
import pathlib
import sys
import tempfile
import unittest

ROOT = pathlib.Path(__file__).resolve().parent.parent.parent
sys.path.insert(0, str(ROOT / "scripts"))

import mutation_tests  # noqa: E402
from mutations import drawn, mutated, mutations, other_numbers  # noqa: E402


def load_script(name):
    loader = importlib.machinery.SourceFileLoader(name, str(ROOT / "scripts" / name))
    module = importlib.util.module_from_spec(importlib.util.spec_from_loader(name, loader))
    loader.exec_module(module)
    return module


mutate = load_script("mutate")

SAMPLE = r'''// if (a < 1 && b)
#include "one < 2"
#define TWICE(x) ((x) * 2)

template <int N = 3>
struct Box {
    void Open();
    void Close();
    bool operator==(const Box& other) const;
};

/* width + 1 */
bool Fits(Box<int>& box, const int* width) {
    const char* const text = "1 < 2 \" + 3" + R"(3 == 4 ")";
    CmTraceInfo("width=", *width + 5, ", text=", text);
    if (*width <= 1'000 && !box.IsOpen())
        return true;
    box.Open();
    box.Fill(*width);
    return width != nullptr || text[0] == '5';
}
'''

CHANGES_OF_SAMPLE = [
    "16:16 <= -> <", "16:16 <= -> >", "16:19 1'000 -> 1001", "16:19 1'000 -> 999", "16:25 && -> ||", "16:28 ! -> ",
    "17:16 true -> false",
    "18:5 box.Open();\n    box.Fill(*width); -> box.Fill(*width);\n    box.Open();",
    "20:18 != -> ==", "20:29 || -> &&", "20:37 0 -> 1", "20:40 == -> !=",
]


def in_function(*lines):
    return "void F() {\n" + "".join(f"    {line}\n" for line in lines) + "}\n"


class Changes(unittest.TestCase):
    def test_are_these_and_no_others(self):
        found = [f"{each.line}:{each.column} {each.old} -> {each.new}" for each in mutations(SAMPLE)]
        self.assertEqual(found, CHANGES_OF_SAMPLE)

    def test_of_a_number_keep_its_form(self):
        for number, others in [
            ("0", ["1"]), ("1U", ["2U", "0U"]), ("0x1F", ["0x20", "0x1e"]), ("0700", ["0701", "0677"]), ("0.0", ["1.0"]),
            ("0.09F", ["0.18F"]), ("1e3", ["2000.0"]), ("1'000ms", ["1001ms", "999ms"]), ("0b11", []),
        ]:
            with self.subTest(number=number):
                self.assertEqual(other_numbers(number), others)

    def test_of_order_are_of_statements_whose_order_matters(self):
        for lines, expected in [
            (["Open();", "Close();"], 1),
            (["Open();", "Close();", "Open();"], 2),
            (["Open();", "Open();"], 0),
            (["x = A;", "x += B;"], 1),
            (["x = A;", "y = B;"], 0),
            (["to.x = from.x;", "to.y = from.y;"], 0),
            (["to.x = from.x;", "to.y = to.x;"], 1),
            (["to.x = Next(from);", "to.y = from.y;"], 0),
            (["to.x = Next(from);", "to.y = Next(from);"], 1),
            (["x = A;", "Tell();"], 1),
            (["x = A; y = B;", "Tell();"], 0),
            (["int x = A;", "int y = B;"], 0),
            (["const int x = A();", "Tell(x);"], 0),
            (["const auto [x, y] = A();", "Tell(y);"], 0),
            (["const int x = A;", "Tell();"], 0),
            (["const Guard lock(m_mutex);", "m_items.clear();"], 1),
            (["Open();", "return Close();"], 0),
            (["if (x)", "    Open();", "Close();"], 0),
            (["Tell({", "    Open();", "});", "Close();"], 0),
            (["Open();", "", "Close();"], 0),
            (["CmTraceInfo(text);", "Close();"], 0),
        ]:
            with self.subTest(lines=lines):
                found = [each for each in mutations(in_function(*lines)) if each.kind == "order"]
                self.assertEqual(len(found), expected)

    def test_leave_declarations_in_their_order(self):
        for opening in ("class A {", "struct A : B {", "template <class T>\nstruct A {", "namespace {", "namespace a::b {"):
            with self.subTest(opening=opening):
                self.assertEqual(mutations(opening + "\n    void Open();\n    void Close();\n}\n"), [])

    def test_can_be_undone(self):
        for change in mutations(SAMPLE):
            changed = mutated(SAMPLE, change)
            self.assertNotEqual(changed, SAMPLE)
            undone = change._replace(old=change.new, new=change.old)
            self.assertEqual(mutated(changed, undone), SAMPLE)

    def test_do_not_go_into_another_text(self):
        with self.assertRaises(ValueError):
            mutated("\n" + SAMPLE, mutations(SAMPLE)[0])


class Draws(unittest.TestCase):
    CHOICES = [("a.cpp", each) for each in mutations(SAMPLE)]

    def test_come_again_with_their_seed(self):
        self.assertEqual(list(drawn(self.CHOICES, 7)), list(drawn(self.CHOICES, 7)))
        self.assertNotEqual(list(drawn(self.CHOICES, 7)), list(drawn(self.CHOICES, 8)))

    def test_take_each_change_once(self):
        self.assertEqual(sorted(drawn(self.CHOICES, 7)), sorted(self.CHOICES))

    def test_take_a_line_as_likely_as_another(self):
        first = collections.Counter(next(drawn(self.CHOICES, seed))[1].line for seed in range(2000))
        self.assertEqual(sorted(first), [16, 17, 18, 20])
        self.assertTrue(all(400 < count < 600 for count in first.values()), first)


class Folder(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name).resolve()
        self.write("root/src/share_region.cpp", SAMPLE)
        self.tree = mutate.Tree(self.folder / "root", self.folder / "tree")
        self.tree.renew()

    def write(self, path, text):
        target = self.folder / path
        target.parent.mkdir(parents=True, exist_ok=True)
        target.write_bytes(text.encode())
        return target


class Trees(Folder):
    PATH = pathlib.Path("src/share_region.cpp")

    def copied(self, path=PATH):
        return (self.folder / "tree" / path).read_bytes().decode()

    def test_change_one_place_and_restore_it_to_the_byte(self):
        odd = "int Ä = 1;\r\n\tint b = 2;"
        self.write("root/src/odd.cpp", odd)
        self.tree.renew()
        self.tree.change(self.PATH, mutations(SAMPLE)[0])
        self.assertEqual(self.copied(), SAMPLE.replace("<= 1'000", "< 1'000"))
        self.tree.change("src/odd.cpp", mutations(odd)[0])
        self.assertEqual(self.copied(), SAMPLE)
        self.assertEqual(self.copied("src/odd.cpp"), odd.replace("1", "2", 1))
        self.tree.restore()
        self.assertEqual(self.copied("src/odd.cpp"), odd)
        self.assertEqual((self.folder / "root" / self.PATH).read_bytes().decode(), SAMPLE)

    def test_follow_the_checkout_and_keep_what_was_built(self):
        built = self.write("tree/build/debug/made.o", "")
        gone = self.write("tree/src/gone.cpp", "")
        os.utime(self.folder / "tree" / self.PATH, (1, 1))
        self.write("root/src/new.cpp", "new")
        self.tree.renew()
        self.assertTrue(built.exists())
        self.assertFalse(gone.exists())
        self.assertEqual(self.copied("src/new.cpp"), "new")
        self.assertEqual((self.folder / "tree" / self.PATH).stat().st_mtime, 1)


class PretendedBuild:
    """Goes by what stands in the source."""

    log = "no log"

    def __init__(self, tree, same):
        self.tree, self.same = tree, same

    def make(self, _targets):
        return "false" not in self.tree.read(Trees.PATH)

    def same_code(self, _path, texts):
        return self.same and len(set(texts)) == 2


class Ends(Folder):
    def test_come_to_all_that_a_command_has_started(self):
        pids = self.folder / "pids"
        command = f"set -m; (sleep 60 & echo $! >>{pids}; sleep 60) & echo $! >>{pids}; wait"
        self.assertIsNone(mutation_tests.run_within(["bash", "-c", command], 0.5))
        for pid in pids.read_text().split():
            self.assertIsNone(mutation_tests.session_of(pathlib.Path("/proc", pid)))


class Verdicts(Folder):
    """The test program looks at the source itself."""

    PROGRAM = r'''#!/bin/sh
if [ "$1" = --gtest_list_tests ]; then
    printf 'Running main()\nSize.\n  IsPositive\n  IsUnderTheLimit\n  DISABLED_Never\nChance.\n  Rules\n'
    printf 'Broken/0.  # TypeParam = int\n  Always\nCompany.\n  IsMinded\n'
    exit
fi
source=../tree/src/share_region.cpp
passes() {
    case $1 in
        Size.IsPositive) ;;
        Size.IsUnderTheLimit) ! grep -q 'width > ' $source || return 1; ! grep -q '1001' $source || sleep 30 ;;
        Chance.Rules) grep -q 'width <= ' $source || ! mkdir once 2>/dev/null ;;
        Broken/0.Always) return 1 ;;
        Company.IsMinded) [ "$0" = ./region_tests ] || [ "$cases" = $1 ] ;;
        *) exit 3 ;;
    esac
}
cases=${1#--gtest_filter=}
IFS=:
for case in $cases; do
    echo "[ RUN      ] $case"
    passes $case || { echo "[  FAILED  ] $case (1 ms)"; exit 1; }
    echo "[       OK ] $case (1 ms)"
done
'''

    def setUp(self):
        super().setUp()
        self.write("tests/programs.txt",
                   "region_tests region screenshare_core\nutil_tests util screenshare_util\nx11_tests x11 screenshare_core\n")
        for name in ("region_tests", "x11_tests"):
            self.write(f"tests/{name}", self.PROGRAM).chmod(0o755)
        self.tests = mutation_tests.Tests(self.folder / "tests", ROOT / "scripts/run_test_case", jobs=2,
                                          memory=self.folder / "measured.json")

    def verdict(self, change, labels=("region",), same=False, servers=False, longest=math.inf):
        wanted = argparse.Namespace(labels=labels, servers=servers, longest=longest)
        judge = mutate.Judge(self.tree, PretendedBuild(self.tree, same), self.tests, wanted)
        try:
            return judge.judge(Trees.PATH, next(each for each in mutations(SAMPLE) if f"{each.old} -> {each.new}" == change))
        finally:
            self.assertEqual(self.tree.read(Trees.PATH), SAMPLE)

    def test_of_a_change_that_a_test_notices(self):
        self.assertEqual(self.verdict("<= -> >"), ("caught", ("Size.IsUnderTheLimit", "fails")))

    def test_of_a_change_that_makes_a_test_hang(self):
        before, mutation_tests.HANG_SECONDS = mutation_tests.HANG_SECONDS, 0.5
        self.addCleanup(setattr, mutation_tests, "HANG_SECONDS", before)
        self.assertEqual(self.verdict("1'000 -> 1001"), ("caught", ("Size.IsUnderTheLimit", "hangs")))

    def test_of_a_change_that_no_test_notices(self):
        self.assertEqual(self.verdict("<= -> <", labels=(), servers=True), ("survived", None))
        self.assertEqual(self.tests.left_out, ["region_tests Broken/0.Always", "x11_tests Broken/0.Always"])
        self.assertEqual(self.tests.unsteady, ["region_tests Chance.Rules"])

    def test_leave_out_servers_unless_they_are_wanted(self):
        self.assertEqual(self.verdict("<= -> <", labels=()), ("survived", None))
        self.assertEqual(self.tests.left_out, ["region_tests Broken/0.Always"])

    def test_are_found_with_many_cases_in_a_process_where_they_get_along(self):
        self.verdict("&& -> ||", labels=(), servers=True)
        cases = ["Chance.Rules", "Company.IsMinded", "Size.IsPositive", "Size.IsUnderTheLimit"]
        batches = {program.name: sorted(sorted(batch.cases) for batch in batches)
                   for program, batches in self.tests.batches.items()}
        self.assertEqual(batches, {"region_tests": [cases], "x11_tests": [[case] for case in cases]})

    def test_are_found_without_cases_of_others_that_take_long(self):
        for best, verdict in (("region", "caught"), ("x11", "survived")):
            self.addCleanup(setattr, mutate, "BEST_LABELS", mutate.BEST_LABELS)
            mutate.BEST_LABELS = [("*", [best])]
            self.write("tests/programs.txt", "region_tests region screenshare_core\nquiet_tests x11 screenshare_core\n")
            self.write("tests/quiet_tests", self.PROGRAM.replace("width > ", "nowhere")).chmod(0o755)
            with self.subTest(best=best):
                self.assertEqual(self.verdict("<= -> >", labels=(), servers=True, longest=0)[0], verdict)

    def test_are_found_without_measuring_the_same_program_twice(self):
        self.verdict("&& -> ||")
        again = mutation_tests.Tests(self.folder / "tests", "/bin/false", jobs=2, memory=self.tests.memory)
        again.measure(next(again.programs()))
        self.assertEqual((again.seconds, again.batches), (self.tests.seconds, self.tests.batches))
        self.assertEqual(again.left_out, ["region_tests Broken/0.Always"])

    def test_are_of_the_program_as_it_is(self):
        self.verdict("&& -> ||")
        again = mutation_tests.Tests(self.folder / "tests", "/bin/false", jobs=2, memory=self.tests.memory)
        self.write("tests/region_tests", self.PROGRAM + "# another").chmod(0o755)
        again.measure(next(again.programs()))
        self.assertEqual(len(again.left_out), 5)

    def test_of_a_change_that_means_the_same(self):
        self.assertEqual(self.verdict("<= -> <", same=True), ("same code", None))

    def test_of_a_change_that_does_not_compile(self):
        self.assertEqual(self.verdict("true -> false"), ("does not compile", None))

    def test_need_a_test_program(self):
        with self.assertRaises(mutate.Fault):
            self.verdict("<= -> <", labels=("util",))


if __name__ == "__main__":
    unittest.main()
