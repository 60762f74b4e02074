#!/usr/bin/env python3
"""Holds the order of the rooms: what each folder of the source tree may include and test for.

    check-rooms.py [ROOT]

Includes point one way: tools, python, duckdb, web -> inspect -> layer -> api -> core -> storage, dictionary -> format ->
trace -> kor. The system, its headers and the byte order are kor's business, which has a file a platform: names that end
in Posix, Windows or Browser. What the program alone asks of the system is in tools/host, by the same rule. No other
source asks for the platform, tests and examples included. What keeps a compiler from its work stands in one file. The
inspection library names no option of the program.

What of core is compiled into programs is installed, in include/tav/core/: the rooms below core do not use it, but for
the header that storage shares with it.

Names in `tav` itself are those of the installed headers: what stays inside the library is in `tav::inside`, and the
steps are in `tav::core`.
"""
import pathlib
import re
import sys

# Room -> the rooms whose internal headers it may include. Public headers (tav/...) are open to all but libkor's rooms.
ROOMS = {
    "kor": {"kor"},
    "trace": {"trace", "kor"},
    "format": {"format", "trace", "kor"},
    "storage": {"storage", "format", "trace", "kor"},
    "dictionary": {"dictionary", "format", "trace", "kor"},
    "core": {"core", "storage", "format", "trace", "kor"},
    "api": {"api", "core", "storage", "dictionary", "format", "trace", "kor"},
    "layer": {"layer", "dictionary"},
    "inspect": {"inspect"},
    "tools": {"tools"},
    "python": {"python"},
    "duckdb": {"duckdb"},
    "web": {"web"},
    "include": set(),
}
# The installed part of core: which of it the rooms below may use.
CORE = "tav/core/"
CORE_SHARED = {"storage": {"tav/core/cachedRun.hpp"}}
BELOW_CORE = ("kor", "trace", "format", "storage", "dictionary")
# libkor knows nothing of libtav.
KOR_ROOMS = {"kor", "trace"}
KOR_PUBLIC = {"tav/kor.h", "tav/codes.h", "tav/byteOrder.h", "tav/decl.h"}
KOR_HEADERS = {f"include/{header}" for header in KOR_PUBLIC}
# What C programs may include, too, and the headers that it has for that.
C_PUBLIC = ("include/tav/codes.h", "include/tav/elements.h", "include/tav/types.h", "include/tav/tav_c.h")
C_HEADERS = {"stddef.h", "stdint.h"}
# What the program's own files of a platform may use of kor, beside its public headers.
FOR_HOST = {"kor/systemError.h", "kor/wideText.h", "kor/windows.h"}
# And what it has for the inspection library.
FOR_INSPECT = {"kor/fileWatch.h"}
# Who may know the platform: the public headers that declare exports and turn bytes, and the files of each platform.
PLATFORM_HEADERS = ("include/tav/decl.h", "include/tav/kor.h", "include/tav/byteOrder.h")
PLATFORM_FILE = re.compile(r"^(kor/(\w+(Posix|Windows)\.cpp|windows\.h)|tools/host/\w+(Posix|Windows)\.cpp)$")
# Sources that are no room: they may include what they like, but must not ask for the platform.
BESIDE = ("tests", "examples", "bench", "fuzz")
# Libraries of others that a room may use.
THIRD_PARTY = {"tools": ("CLI/", "nlohmann/"), "python": ("Python.h", "datetime.h", "structmember.h"),
               "duckdb": ("duckdb_extension.h",)}

# A namespace of the users' own names, in a source that is not installed.
USERS_NAMESPACE = re.compile(r"^\s*namespace\s+tav\s*(\{|$)")

STANDARD = set(
    """algorithm any array atomic barrier bit bitset cassert cctype cerrno cfenv cfloat charconv chrono cinttypes
    climits clocale cmath codecvt compare complex concepts condition_variable coroutine csetjmp csignal cstdarg cstddef
    cstdint cstdio cstdlib cstring ctime cuchar cwchar cwctype deque exception execution filesystem format
    forward_list fstream functional future initializer_list iomanip ios iosfwd iostream istream iterator latch limits
    list locale map memory memory_resource mutex new numbers numeric optional ostream queue random ranges ratio regex
    scoped_allocator semaphore set shared_mutex source_location span sstream stack stdexcept stop_token streambuf
    string string_view strstream syncstream system_error thread tuple type_traits typeindex typeinfo unordered_map
    unordered_set utility valarray variant vector version""".split()
)

INCLUDE = re.compile(r'^\s*#\s*include\s*(?P<open>[<"])(?P<path>[^>"]+)[>"]')
SYSTEM = r"_WIN32|_WIN64|WIN32|__unix__|__linux__|__linux|__APPLE__|__FreeBSD__|_MSC_VER|__MINGW\w*|__CYGWIN__"
SYSTEM_TEST = re.compile(rf"^\s*#\s*(?:if|elif|ifdef|ifndef)\b.*\b({SYSTEM}|__has_include)\b")
PLATFORM_TEST = re.compile(
    rf"\b({SYSTEM}|"
    r"__BYTE_ORDER__|__BYTE_ORDER|__ORDER_\w+_ENDIAN__|__(?:BIG|LITTLE)_ENDIAN__|WORDS_BIGENDIAN|"
    r"std::endian|htonl|htons|ntohl|ntohs|hto[bl]e(?:16|32|64)|[bl]e(?:16|32|64)toh)\b"
)
# Tricks with the compiler, and the one file of the libraries that may hold them. What a signal's handler looks at has
# to be volatile, which is none.
TRICK = re.compile(r"__asm__|\basm\b|gnu::used|\bvolatile\b(?! std::sig_atomic_t)")
TRICK_FILE = "core/word.h"
# A text of the inspection library that names an option of the program: each program has its own.
TEXT = re.compile(r'"(?:[^"\\]|\\.)*"')
OPTION = re.compile(r"(?<![-\w])--[a-z][a-z-]*")
INSPECT = ("inspect/", "include/tav/inspect")
COMMENT = re.compile(r"//.*$")


def knows_platform(name):
    return name in PLATFORM_HEADERS or PLATFORM_FILE.match(name) is not None


def include_error(name, room, opening, path):
    """Why a file must not include `path`, or None."""
    first = path.split("/")[0]
    if path.startswith("tav/"):
        if (room in KOR_ROOMS or name in KOR_HEADERS) and path not in KOR_PUBLIC:
            return f"libkor includes {path} of libtav"
        if path.startswith(CORE) and room in BELOW_CORE and path not in CORE_SHARED.get(room, ()):
            return f"{room} must not include {path}"
        return None
    if opening == '"':
        if "/" not in path:
            return f'"{path}" is named without its room'
        if (first in ROOMS and first in ROOMS[room]) or (room == "inspect" and path in FOR_INSPECT) or \
                (room == "tools" and knows_platform(name) and path in FOR_HOST):
            return None
        return f"{room} must not include {path}"
    if name in C_PUBLIC and path in C_HEADERS:
        return None
    if path in STANDARD or knows_platform(name) or path.startswith(THIRD_PARTY.get(room, ())):
        return None
    return f"<{path}> is no header of the standard library; the system is reached through kor"


def check_text(name, text):
    """Yields (line number, what is wrong) of one file; `name` is its path from the root."""
    room = name.split("/")[0]
    if room in BESIDE:
        for number, line in enumerate(text.splitlines(), start=1):
            found = SYSTEM_TEST.search(COMMENT.sub("", line))
            if found:
                yield number, f"{found[1]}: the platform is kor's business; a file a platform serves the tests"
        return
    for number, line in enumerate(text.splitlines(), start=1):
        match = INCLUDE.match(line)
        trick = TRICK.search(COMMENT.sub("", line))
        if trick and name != TRICK_FILE:
            yield number, f"{trick[0]}: tricks with the compiler stand in {TRICK_FILE}"
        option = name.startswith(INSPECT) and OPTION.search(" ".join(TEXT.findall(line)))
        if option:
            yield number, f"{option[0]}: options are the program's; a Remedy tells it what helps"
        if match:
            error = include_error(name, room, match["open"], match["path"])
            if error:
                yield number, error
        elif room != "include" and USERS_NAMESPACE.match(line):
            yield number, "names in tav itself are those of the installed headers; these belong into tav::inside"
        elif not knows_platform(name):
            found = PLATFORM_TEST.search(COMMENT.sub("", line))
            if found:
                yield number, f"{found[0]}: the platform and the byte order are kor's business"


def check_tree(root):
    """Returns (number of files looked at, findings as lines of text)."""
    files = 0
    findings = []
    for room in (*ROOMS, *BESIDE):
        for path in sorted((root / room).rglob("*")):
            if "node_modules" in path.parts or path.suffix not in (".h", ".hpp", ".cpp", ".def"):
                continue
            files += 1
            name = path.relative_to(root).as_posix()
            findings += [f"{name}:{line}: {what}" for line, what in check_text(name, path.read_text(encoding="utf-8"))]
    return files, findings


def main(arguments):
    root = pathlib.Path(arguments[0]) if arguments else pathlib.Path(__file__).resolve().parent.parent
    files, findings = check_tree(root)
    print("\n".join(findings + [f"{files} files, {len(findings)} findings"]))
    return 1 if findings or files == 0 else 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
