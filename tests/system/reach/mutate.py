#!/usr/bin/env python3
"""Changes the library in small ways, one at a time, and reports which changes no test notices.

    tests/system/reach/mutate.py [--seed N] [--count N] [--group GROUP] [--only SOURCE:LINE] [--list]

A mutant is one changed operator, constant, condition or a statement left out, in the reader, the steps of core, the
ring, the writer, what recovers damaged streams, or what makes columns and tables of streams.
Which ones are tried follows from the seed alone. A mutant counts when it compiles, and to other instructions than the
original; it is killed when a test program fails, crashes or hangs. Survivors that nobody can tell from the original
stand in equivalent.txt, each with the reason. Fails when fewer than 95 % of the others are killed.
"""
import argparse
import concurrent.futures
import dataclasses
import os
import pathlib
import random
import re
import resource
import shlex
import subprocess
import sys
import tempfile
import time

ROOT = pathlib.Path(__file__).resolve().parents[3]
BUILD = ROOT / "build" / "mutation"
ARGUED = pathlib.Path(__file__).with_name("equivalent.txt")
LEAST = 0.95

GROUPS = {
    "reader": [
        "api/readNode.cpp", "api/stepForward.cpp", "include/tav/core/node.hpp", "include/tav/core/step.hpp",
        "core/step.h", "api/fetchBytes.cpp", "api/fetchBytes.h", "api/findElement.cpp", "api/findLogicalGroup.cpp",
        "api/findNodeFromIndex.cpp",
        "api/stepBack.cpp", "api/findEyeCatcher.cpp", "api/uncalledOperations.cpp", "api/validateSubtree.cpp",
        "api/walkGuard.h",
    ],
    "core": [
        "core/append.h", "core/bytes.h", "core/close.h", "core/fastWay.h", "core/plainNodes.h", "core/stack.h", "core/word.h",
        "include/tav/core/append.hpp", "include/tav/core/bytes.hpp", "include/tav/core/copySmall.hpp",
        "include/tav/core/fastWay.hpp", "include/tav/core/search.hpp", "include/tav/core/words.hpp",
    ],
    "ring": [
        "storage/circularBuf.cpp", "storage/circularFill.cpp", "storage/circularRelease.cpp", "storage/cachedRun.cpp",
        "include/tav/core/cachedRun.hpp",
    ],
    "writer": [
        "api/addNode.cpp", "api/addStream.cpp", "api/addString.cpp", "api/rawWrite.cpp", "api/rawWrite.h",
        "api/closeGroup.cpp", "api/updateElement.cpp",
    ],
    "recover": [
        "inspect/recover/judge.cpp", "inspect/recover/search.cpp", "inspect/recover/recovery.cpp",
        "inspect/recover/nesting.cpp", "inspect/recover/place.cpp", "inspect/recover/ledger.cpp",
        "inspect/recover/endings.cpp", "inspect/recover/forms.cpp", "inspect/recover/rebuild.cpp",
        "inspect/walk/prober.cpp",
    ],
    "columns": [
        "inspect/columns/nodeReader.cpp", "inspect/columns/nodeColumns.cpp", "inspect/columns/addRow.h",
        "inspect/table/automaton.cpp", "inspect/table/chunk.cpp", "inspect/table/chunk.h",
        "inspect/table/columnType.cpp", "inspect/table/cut.cpp", "inspect/table/filling.cpp",
        "inspect/table/query.cpp", "inspect/table/reading.cpp",
    ],
}
# The test programs, in the order in which they are likely to notice, without the few tests that take seconds each.
SLOW = "*RandomTrees.PrintAsTheRulesSay*:HostileStream.TruncatedAtEveryLength:HugeStream.*"
PROGRAMS = {
    "reader": ["api_tests", "golden_tests", "property_tests", "cpp_tests", "storage_tests"],
    "core": ["core_tests", "api_tests", "golden_tests", "property_tests", "cpp_tests", "storage_tests"],
    "ring": ["storage_tests", "property_tests", "api_tests", "golden_tests", "cpp_tests"],
    "writer": ["api_tests", "golden_tests", "property_tests", "cpp_tests", "storage_tests"],
    "recover": ["inspect_tests"],
    "columns": ["inspect_tests"],
}
# The program whose sources are compiled with the changed header, too, and run first: they use it as programs do that
# compile it into themselves. Mostly it notices, and the library need not be compiled.
OWN = {"core": "core_tests"}
# The tests that a group's programs are run with where all of them take most of a minute: those of its own sources, and
# of what is built on them as far as they are quick. What others alone would notice counts as unnoticed.
ONLY = {
    "recover": "*Recover*:*Judg*:*Search*:*Prob*:*Ledger*:*Ending*:Walker.*:Recognise.*:*Damage*:TestDocument.EndsOver*",
    "columns": "*Table*:NodeRows.*:Parallel.MakesNoRows*:Folds.*:TestDocument.*",
}
NOT_QUICK = {"columns": "Parallel.MakesTablesOfLongGroups*:Parallel.MakesTablesOfRoots*"}

# Binary operators stand between spaces in this code; brackets of templates, pointers and references do not.
OPERATORS = {
    "<": ["<="], "<=": ["<"], ">": [">="], ">=": [">"], "==": ["!="], "!=": ["=="],
    "+": ["-"], "-": ["+"], "*": ["/"], "/": ["*"], "%": ["/"],
    "&&": ["||"], "||": ["&&"], "&": ["|"], "|": ["&"],
    "+=": ["-="], "-=": ["+="], "|=": ["&="],
}
OPERATOR = re.compile(r"(?<= )(?:<=|>=|==|!=|&&|\|\||\+=|-=|\|=|<|>|\+|-|\*|/|%|&|\|)(?= |$)")
CONSTANT = re.compile(r"(?<![\w.'])(?:0x[0-9A-Fa-f]+|\d+)(?![\w.'])")
TRUTH = re.compile(r"\b(?:true|false)\b")
CONDITION = re.compile(r"\b(?:if|while) \(")
STATEMENT = re.compile(r"\s*(?:\*?[\w.\[\]>:-]+ (?:=|\+=|-=|\|=|&=) .*|(?:static_cast<void>\()?[\w:.>-]+(?<!return)\(.*\));$")


@dataclasses.dataclass
class Mutant:
    group: str
    source: str
    line: int  # from 1
    nth: int   # of the source's lines that read like this one
    before: str
    after: str

    def keys(self):
        """Under which it may stand in equivalent.txt."""
        source = self.source if self.nth == 1 else f"{self.source} #{self.nth}"
        return {(source, self.before.strip(), after) for after in (self.after.strip(), "(anything)")}

    def __str__(self):
        return f"{self.source}:{self.line}\n  - {self.before.strip()}\n  + {self.after.strip() or '(left out)'}"


@dataclasses.dataclass
class Verdict:
    mutant: Mutant
    what: str  # killed, survived, same, broken
    by: str = ""
    seconds: float = 0


def code_only(text):
    """The text with comments, texts and directives blanked out, character by character."""
    blank = lambda match: re.sub(r"[^\n]", " ", match.group())
    text = re.sub(r'//[^\n]*|/\*.*?\*/|"(?:\\.|[^"\\\n])*"|\'(?:\\.|[^\'\\\n])\'', blank, text, flags=re.S)
    return re.sub(r"^\s*(?:#|static_assert|template|using|constexpr const char).*$", blank, text, flags=re.M)


def closing(code, start):
    depth = 0
    for at in range(start, len(code)):
        depth += {"(": 1, ")": -1}.get(code[at], 0)
        if depth == 0:
            return at
    return None


def edits(code):
    """All single changes of a line: (from, to, new characters)."""
    for match in OPERATOR.finditer(code):
        for other in OPERATORS[match.group()]:
            yield match.start(), match.end(), other
    for match in CONSTANT.finditer(code):
        value = int(match.group(), 0)
        yield match.start(), match.end(), str(value + 1)
        if value > 0:
            yield match.start(), match.end(), str(value - 1)
    for match in TRUTH.finditer(code):
        yield match.start(), match.end(), "false" if match.group() == "true" else "true"
    for match in CONDITION.finditer(code):
        end = closing(code, match.end() - 1)
        if end is not None:
            yield match.end(), end, f"!({code[match.end():end]})"


def mutants_of(group, source):
    text = (ROOT / source).read_text()
    lines = text.split("\n")
    codes = code_only(text).split("\n")
    before = "{"
    for number, (line, code) in enumerate(zip(lines, codes), 1):
        nth = sum(other.strip() == line.strip() for other in lines[:number])
        for start, end, new in edits(code):
            yield Mutant(group, source, number, nth, line, line[:start] + new + line[end:])
        if before[-1] in "{};" and STATEMENT.match(code):
            yield Mutant(group, source, number, nth, line, "")
        if code.strip():
            before = code.strip()


def is_run(group, source):
    """Whether a group's test programs run what a source becomes: only those of inspection run that."""
    return not source.startswith("inspect/") or "inspect_tests" in PROGRAMS[group]


def run(command, **more):
    return subprocess.run(command, check=True, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True, **more).stdout


class Builder:
    """The library's objects, and the test programs but for the library."""

    def __init__(self, programs):
        run(["cmake", "-S", ROOT, "-B", BUILD, "-G", "Ninja", "-DCMAKE_CXX_COMPILER=g++", "-DCMAKE_BUILD_TYPE=Release",
             "-DTAV_BUILD_TESTS=ON", "-DTAV_BUILD_TOOLS=OFF", "-DTAV_BUILD_EXAMPLES=OFF"])
        subprocess.run(["cmake", "--build", BUILD, "--parallel", str(os.cpu_count()), "--target", "tav_internal",
                        *programs], check=True, stdout=subprocess.DEVNULL)
        self.compiles = self._compiles("tav_internal", "_objects")
        self.users = self._users(self.compiles)
        self.own = {program: self._compiles(program, program) for program in OWN.values() if program in programs}
        self.own_users = {program: self._users(compiles) for program, compiles in self.own.items()}
        self.original = {}
        self.links = {program: self._link(program) for program in programs}

    def _compiles(self, target, folder):
        """Source to (object, command that writes assembly to its end), of the objects in folders that end so."""
        found = {}
        for line in run(["ninja", "-C", BUILD, "-t", "commands", target]).splitlines():
            match = re.search(rf"-o (\S+{folder}\.dir/\S+\.o) -c (\S+)$", line)
            if match:
                words = [word for word in shlex.split(line[:match.start()]) if not word.startswith("-W")]
                words = self._without_dependencies(words)
                if pathlib.Path(words[0]).name == "ccache": # which has no use for what is compiled once
                    words = words[1:]
                found[os.path.relpath(match.group(2), ROOT)] = match.group(1), [*words, "-g0", "-S"]
        return found

    @staticmethod
    def _without_dependencies(words):
        kept = []
        skip = False
        for word in words:
            if skip:
                skip = False
            elif word in ("-MF", "-MT"):
                skip = True
            elif word != "-MD":
                kept.append(word)
        return kept

    @staticmethod
    def _users(compiles):
        """Header to those of the sources that include it."""
        users = {}
        objects = {name: source for source, (name, _) in compiles.items()}
        current = None
        for line in run(["ninja", "-C", BUILD, "-t", "deps"]).splitlines():
            if line and not line.startswith(" "):
                current = objects.get(line.split(":")[0])
            elif current and line.strip():
                header = os.path.relpath(os.path.join(BUILD, line.strip()), ROOT)
                users.setdefault(header, []).append(current)
        return users

    def _link(self, program):
        """The command's words, with the library's place at its front; the tests' objects are joined once, but for those
        that may be compiled anew."""
        line = run(["ninja", "-C", BUILD, "-t", "commands", program]).splitlines()[-1]
        words = [word for word in shlex.split(line) if word not in (":", "&&")]
        ours = set(run(["ar", "t", BUILD / "libtav_internal.a"]).split())
        anew = {name for name, _ in self.own.get(program, {}).values()}
        objects = [word for word in words
                   if word.endswith(".o") and pathlib.Path(word).name not in ours and word not in anew]
        joined = BUILD / f"{program}.joined.o"
        run(["ld", "-r", "-o", joined, *objects], cwd=BUILD)
        at = words.index("-o")
        libraries = [word for word in words[at + 2:] if word != "libtav_internal.a" and not word.endswith(".o")]
        return [words[0], str(joined), *libraries]

    @staticmethod
    def assembly(command, source, folder, path):
        """What a source at `path` becomes; headers in `folder` come first. None when it does not compile."""
        target = folder / (source.replace("/", "_") + ".s")
        search = [f"-I{folder}", f"-I{folder}/include"]
        done = subprocess.run([command[0], *search, *command[1:], "-o", target, path], cwd=BUILD, text=True,
                              stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
        if done.returncode != 0:
            return None
        text = re.sub(r"^\s*\.(?:file|ident).*$", "", target.read_text(), flags=re.M)
        return text, target

    def assembly_before(self, source):
        if source not in self.original:
            with tempfile.TemporaryDirectory() as folder:
                command = self.compiles[source][1]
                self.original[source] = self.assembly(command, source, pathlib.Path(folder), ROOT / source)[0]
        return self.original[source]

    @staticmethod
    def assembled(text_and_target):
        target = text_and_target[1].with_suffix(".o")
        run(["as", "-o", target, text_and_target[1]])
        return target

    @staticmethod
    def write(mutant, folder):
        """Writes the changed source, and returns its place."""
        text = (ROOT / mutant.source).read_text().split("\n")
        text[mutant.line - 1] = mutant.after
        changed = folder / mutant.source
        changed.parent.mkdir(parents=True)
        changed.write_text("\n".join(text))
        return changed

    def own_objects(self, mutant, folder):
        """The group's own tests with a changed header: their objects by those that they replace, None when one does not
        compile, which says nothing of the library."""
        program = OWN.get(mutant.group)
        made = {}
        for source in self.own_users[program].get(mutant.source, []) if program else []:
            name, command = self.own[program][source]
            after = self.assembly(command, source, folder, ROOT / source)
            if after is None:
                return None
            made[name] = self.assembled(after)
        return made

    def objects(self, mutant, folder, changed):
        """Compiles what a mutant changes: the new objects by those that they replace, none when no instruction changes,
        None when it does not compile."""
        made = {}
        users = [mutant.source] if mutant.source in self.compiles else self.users.get(mutant.source, [])
        for source in sorted(users, key=lambda one: not is_run(mutant.group, one)):
            if made and not is_run(mutant.group, source):
                break # that there is a change is known, and no test would run this one
            name, command = self.compiles[source]
            after = self.assembly(command, source, folder, changed if source == mutant.source else ROOT / source)
            if after is None:
                return None
            if after[0] != self.assembly_before(source):
                made[name] = self.assembled(after)
        return made

    def link(self, program, replaced, folder):
        """The program with the library's objects, some of which may be replaced. Sources of different rooms have the
        same names, so an archive would not do."""
        target = folder / program
        compiler, *rest = self.links[program]
        parts = [*self.own.get(program, {}).values(), *self.compiles.values()]
        run([compiler, *[replaced.get(name, name) for name, _ in parts], *rest, "-o", target], cwd=BUILD)
        return target


def tests_of(group):
    """The filter for a group's tests."""
    return f"{ONLY.get(group, '*')}-{SLOW}:{NOT_QUICK.get(group, '')}"


def passes(program, folder, seconds, tests):
    """Whether a test program succeeds in so many seconds of processor time, with the tests that a filter selects. As a
    child of another program it does not begin with Python's memory as its own peak, and it ends by itself when this
    script is stopped."""
    folder.chmod(0o755) # some tests give up their rights and still have to get at their files
    environment = dict(os.environ, TMPDIR=str(folder), TAV_TEST_CASES="300", GTEST_FILTER=tests)
    command = ["timeout", "--signal=KILL", str(20 * seconds), program, "--gtest_fail_fast", "--gtest_brief=1"]

    def limit():
        resource.setrlimit(resource.RLIMIT_CORE, (0, 0))
        resource.setrlimit(resource.RLIMIT_DATA, (6 << 30, 6 << 30))
        resource.setrlimit(resource.RLIMIT_CPU, (seconds, seconds))

    done = subprocess.run(command, cwd=ROOT / "tests", env=environment, stdout=subprocess.DEVNULL,
                          stderr=subprocess.DEVNULL, preexec_fn=limit)
    return done.returncode == 0


def processor_time():
    used = resource.getrusage(resource.RUSAGE_CHILDREN)
    return used.ru_utime + used.ru_stime


def time_limits(builder, groups):
    """How long the programs may take for each group: twice what they do on the library as it is, where they must
    succeed."""
    seconds = {}
    known = {}
    with tempfile.TemporaryDirectory() as name:
        folder = pathlib.Path(name)
        for group, program in [(group, program) for group in groups for program in PROGRAMS[group]]:
            tests = tests_of(group)
            if (program, tests) not in known:
                linked = builder.link(program, {}, folder)
                start = processor_time()
                if not passes(linked, folder, 300, tests):
                    sys.exit(f"{program} fails without any change")
                taken = processor_time() - start
                known[program, tests] = int(2 * taken) + 2
                print(f"{program} for {group}: {taken:.1f} s", flush=True)
            seconds[group, program] = known[program, tests]
    return seconds


def judge(builder, limits, mutant):
    start = time.monotonic()

    def is_noticed(program, objects):
        return not passes(builder.link(program, objects, folder), folder, limits[mutant.group, program],
                          tests_of(mutant.group))

    with tempfile.TemporaryDirectory(ignore_cleanup_errors=True) as name:
        folder = pathlib.Path(name)
        changed = builder.write(mutant, folder)
        own = builder.own_objects(mutant, folder)
        if own and is_noticed(OWN[mutant.group], own):
            return Verdict(mutant, "killed", OWN[mutant.group], time.monotonic() - start)
        objects = builder.objects(mutant, folder, changed)
        if not objects:
            return Verdict(mutant, "broken" if objects is None else "same")
        for program in PROGRAMS[mutant.group]:
            if is_noticed(program, objects):
                return Verdict(mutant, "killed", program, time.monotonic() - start)
    return Verdict(mutant, "survived", "", time.monotonic() - start)


def argued():
    """The keys of equivalent.txt: blocks of a file, the line, the changed line, or "(anything)", and the reason."""
    keys = {}
    for block in re.split(r"\n\s*\n", ARGUED.read_text() if ARGUED.exists() else ""):
        lines = [line for line in block.split("\n") if line and not line.startswith("#")]
        if not lines:
            continue
        if len(lines) < 4 or not lines[1].startswith("  - ") or not lines[2].startswith("  + "):
            sys.exit(f"{ARGUED.name}: cannot read\n{block}")
        after = lines[2][4:].strip()
        keys[lines[0].strip(), lines[1][4:].strip(), "" if after == "(left out)" else after] = "\n".join(lines[3:])
    return keys


def chosen(group, seed):
    """All mutants of a group in the seed's order."""
    found = [mutant for source in GROUPS[group] for mutant in mutants_of(group, source)]
    random.Random(f"{seed} {group}").shuffle(found)
    return found


def try_group(builder, limits, group, arguments):
    """The verdicts on a group's first mutants that count."""
    verdicts = []
    counted = 0
    queue = chosen(group, arguments.seed)
    if arguments.only:
        queue = [one for one in queue if f"{one.source}:{one.line}" in arguments.only]
    print(f"\n{group}: {len(queue)} possible changes", flush=True)
    with concurrent.futures.ThreadPoolExecutor(arguments.jobs) as pool:
        step = 8 * arguments.jobs
        for first in range(0, len(queue), step):
            for verdict in pool.map(lambda one: judge(builder, limits, one), queue[first:first + step]):
                if counted == arguments.count:
                    break
                verdicts.append(verdict)
                counted += verdict.what in ("killed", "survived")
                if verdict.what in ("killed", "survived"):
                    print(f"{counted:4} {verdict.what:8} {verdict.by:14} {verdict.seconds:5.1f} s  "
                          f"{verdict.mutant.source}:{verdict.mutant.line}", flush=True)
                    if verdict.what == "survived":
                        print(verdict.mutant, flush=True)
            if counted == arguments.count:
                break
    return verdicts


def report(verdicts, reasons):
    """Prints the table and the survivors; whether enough were killed."""
    print(f"\n{'group':8} {'mutants':>8} {'killed':>7} {'argued':>7} {'survived':>9} {'killed of those that differ':>28}")
    good = True
    open_ones = []
    for group in [*GROUPS, "all"]:
        own = [one for one in verdicts if group in (one.mutant.group, "all")]
        killed = [one for one in own if one.what == "killed"]
        alike = [one for one in own if one.what == "survived" and one.mutant.keys() & reasons.keys()]
        left = [one for one in own if one.what == "survived" and not one.mutant.keys() & reasons.keys()]
        if not killed and not left:
            continue
        share = len(killed) / (len(killed) + len(left))
        good = good and share >= LEAST
        open_ones = left
        print(f"{group:8} {len(killed) + len(alike) + len(left):8} {len(killed):7} {len(alike):7} {len(left):9} "
              f"{100 * share:27.1f}%")
    set_aside = [one.what for one in verdicts]
    print(f"set aside: {set_aside.count('same')} with the same instructions, {set_aside.count('broken')} that do not compile")
    for one in open_ones:
        print(f"\nsurvived: {one.mutant}")
    for one in verdicts:
        if one.what == "killed" and one.mutant.keys() & reasons.keys():
            print(f"\nargued to be equivalent, but killed by {one.by}: {one.mutant}")
            good = False
    return good


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--count", type=int, default=70, help="mutants that count, for each group")
    parser.add_argument("--group", choices=GROUPS, action="append")
    parser.add_argument("--only", metavar="SOURCE:LINE", action="append", help="the changes of these lines alone")
    parser.add_argument("--jobs", type=int, default=os.cpu_count())
    parser.add_argument("--list", action="store_true", help="print the mutants in the seed's order instead")
    arguments = parser.parse_args()
    groups = arguments.group or list(GROUPS)
    if arguments.list:
        for group in groups:
            for mutant in chosen(group, arguments.seed):
                print(mutant)
        return 0
    reasons = argued()
    programs = sorted({program for group in groups for program in PROGRAMS[group]})
    builder = Builder(programs)
    limits = time_limits(builder, groups)
    verdicts = [verdict for group in groups for verdict in try_group(builder, limits, group, arguments)]
    return 0 if report(verdicts, reasons) else 1


if __name__ == "__main__":
    sys.exit(main())
