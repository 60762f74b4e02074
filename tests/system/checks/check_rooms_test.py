"""The rule of the rooms, on single lines and on a small tree."""
import importlib.util
import pathlib
import tempfile
import unittest

ROOT = pathlib.Path(__file__).resolve().parents[3]
SPEC = importlib.util.spec_from_file_location("check_rooms", ROOT / "cmake" / "check-rooms.py")
check_rooms = importlib.util.module_from_spec(SPEC)
SPEC.loader.exec_module(check_rooms)


def findings(name, line):
    return [what for _, what in check_rooms.check_text(name, line)]


class CheckRooms(unittest.TestCase):
    def test_accepts_what_points_down(self):
        for name, line in [
            ("api/writer.cpp", '#include "storage/circularBuf.h"'),
            ("api/writer.cpp", '#include "trace/traceFrame.h"'),
            ("layer/path.cpp", '#include "layer/pathParser.h"'),
            ("layer/path.cpp", '#include "tav/path/path.hpp"'),
            ("api/writer.cpp", '#include "core/append.h"'),
            ("trace/trace.cpp", '#include "kor/lock.h"'),
            ("trace/trace.cpp", '#include "tav/kor.h"'),
            ("core/word.h", '#include "storage/cachedRun.h"'),
            ("core/bytes.h", '#include "tav/core/bytes.hpp"'),
            ("storage/cachedRun.h", '#include "tav/core/cachedRun.hpp"'),
            ("include/tav/cpp/node.hpp", '#include "tav/core/step.hpp"'),
            ("storage/file.cpp", '#include "format/layout.h"'),
            ("dictionary/lookup.cpp", '#include "dictionary/dictionary.h"'),
            ("tools/main.cpp", '#include "tav/tav.h"'),
            ("tools/main.cpp", '#include "tools/options.h"'),
            ("kor/file.cpp", '#include "tav/kor.h"'),
            ("format/layout.h", "#include <cstdint>"),
            ("kor/filePosix.cpp", "#include <sys/file.h>"),
            ("include/tav/byteOrder.h", "#if __BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__"),
            ("tools/output.cpp", '#include "tools/host/host.h"'),
            ("tools/host/hostPosix.cpp", "#include <unistd.h>"),
            ("tools/host/hostWindows.cpp", '#include "kor/windows.h"'),
            ("tools/host/hostFilePosix.cpp", '#include "kor/systemError.h"'),
            ("kor/windows.h", "#include <windows.h>"),
            ("kor/fileWindows.cpp", "#include <io.h>"),
            ("tests/kor/childPosix.h", "#include <sys/wait.h>"),
            ("tests/support/platformWindows.cpp", "#include <psapi.h>"),
            ("tests/kor/filePosix_test.cpp", "#if defined(__SANITIZE_THREAD__)"),
            ("tools/options.cpp", "#include <CLI/CLI.hpp>"),
            ("web/module/tree.cpp", '#include "web/module/tree.h"'),
            ("web/module/tree.cpp", '#include "tav/inspect.hpp"'),
            ("include/tav/kor.h", "#if defined(_WIN32)"),
        ]:
            with self.subTest(name=name, line=line):
                self.assertEqual(findings(name, line), [])

    def test_refuses_what_points_up_or_sideways(self):
        for name, line in [
            ("kor/file.cpp", '#include "format/layout.h"'),
            ("web/module/tree.cpp", '#include "inspect/document/streamWalk.h"'),
            ("inspect/walk/walker.cpp", '#include "web/module/tree.h"'),
            ("kor/file.cpp", '#include "tav/tav.h"'),
            ("include/tav/kor.h", '#include "tav/tav.h"'),
            ("kor/file.cpp", '#include "trace/traceFrame.h"'),
            ("trace/traceFrame.h", '#include "format/layout.h"'),
            ("trace/traceFrame.h", '#include "tav/probes.h"'),
            ("format/layout.h", '#include "storage/circularBuf.h"'),
            ("core/step.h", '#include "api/rawWrite.h"'),
            ("core/step.h", '#include "dictionary/dictionary.h"'),
            ("storage/file.cpp", '#include "core/bytes.h"'),
            ("storage/file.cpp", '#include "tav/core/bytes.hpp"'),
            ("format/eyeSearch.cpp", '#include "tav/core/step.hpp"'),
            ("include/tav/core/step.hpp", '#include "core/word.h"'),
            ("storage/file.cpp", '#include "api/reader.h"'),
            ("layer/path.cpp", '#include "api/readNode.h"'),
            ("inspect/path/search.cpp", '#include "layer/pathTree.h"'),
            ("storage/file.cpp", '#include "dictionary/dictionary.h"'),
            ("dictionary/lookup.cpp", '#include "storage/circularBuf.h"'),
            ("tools/main.cpp", '#include "api/reader.h"'),
            ("include/tav/tav.h", '#include "format/layout.h"'),
            ("api/writer.cpp", '#  include "tools/options.h"'),
            ("api/writer.cpp", '#include "writer.h"'),
            ("api/printer.cpp", "#include <nlohmann/json.hpp>"),
        ]:
            with self.subTest(name=name, line=line):
                self.assertEqual(len(findings(name, line)), 1)

    def test_keeps_tricks_with_the_compiler_in_one_file(self):
        for line in [
            '__asm__("" ::: "memory");',
            "[[gnu::noinline, gnu::used]] void f();",
            "const volatile int& a = b;",
            "static_cast<volatile int&>(a) = b;",
        ]:
            with self.subTest(line=line):
                self.assertEqual(len(findings("include/tav/layout.hpp", line)), 1)
                self.assertEqual(len(findings("core/step.h", line)), 1)
                self.assertEqual(len(findings("include/tav/core/step.hpp", line)), 1)
                self.assertEqual(findings("core/word.h", line), [])
        self.assertEqual(findings("tools/host/host.cpp", "volatile std::sig_atomic_t held = 0;"), [])

    def test_keeps_options_of_the_program_out_of_the_inspection_library(self):
        for line in ['return "--from " + text;', 'hint = "a 32-bit stream; --root 64 reads it";', 'Error("x", "--align");']:
            with self.subTest(line=line):
                self.assertEqual(len(findings("inspect/walk/source.cpp", line)), 1)
                self.assertEqual(len(findings("include/tav/inspect/form.hpp", line)), 1)
                self.assertEqual(findings("tools/shell/hints.cpp", line), [])
        for line in ['text = "a -- b";', "--count; // as --from", 'x = "a"; --count;']:
            with self.subTest(line=line):
                self.assertEqual(findings("inspect/walk/source.cpp", line), [])

    def test_keeps_the_platform_in_kor(self):
        for name, line in [
            ("format/swap.cpp", "#include <endian.h>"),
            ("api/printer.cpp", "#include <unistd.h>"),
            ("tools/main.cpp", "#include <windows.h>"),
            ("format/swap.cpp", "#ifdef _WIN32"),
            ("format/swap.cpp", "if constexpr (std::endian::native == std::endian::little)"),
            ("include/tav/tav.h", "#if defined(__linux__)"),
            ("kor/thread.cpp", "#if defined(_WIN32)"),
            ("kor/thread.cpp", "#include <unistd.h>"),
            ("kor/filePosix.h", "#include <unistd.h>"),
            ("tools/output.cpp", '#include "kor/systemError.h"'),
            ("tools/host/host.h", '#include "kor/systemError.h"'),
            ("tools/host/host.h", "#include <unistd.h>"),
            ("tools/host/hostPosix.cpp", '#include "kor/fileNative.h"'),
            ("tests/kor/file_test.cpp", "#ifdef _WIN32"),
            ("tests/support/platform.h", "# if !defined(__linux__)"),
            ("examples/snapshot.cpp", "#if defined(__APPLE__) || defined(__unix__)"),
            ("bench/workload.cpp", "#elif _MSC_VER"),
            ("fuzz/driver.cpp", "#if __has_include(<unistd.h>)"),
        ]:
            with self.subTest(name=name, line=line):
                self.assertEqual(len(findings(name, line)), 1)

    def test_leaves_the_users_names_to_the_installed_headers(self):
        for name, line in [
            ("api/nodeStep.h", "namespace tav"),
            ("trace/traceFrame.h", "namespace tav {"),
            ("tools/form.h", "namespace tav"),
        ]:
            with self.subTest(name=name, line=line):
                self.assertEqual(len(findings(name, line)), 1)
        for name, line in [
            ("include/tav/cpp/node.hpp", "namespace tav"),
            ("api/nodeStep.h", "namespace tav::inside"),
            ("api/nodeStep.h", "using namespace tav;"),
        ]:
            with self.subTest(name=name, line=line):
                self.assertEqual(findings(name, line), [])

    def test_ignores_line_comments(self):
        self.assertEqual(findings("api/printer.cpp", "int x; // the same on _WIN32"), [])

    def test_reports_file_and_line_of_a_tree(self):
        with tempfile.TemporaryDirectory() as folder:
            root = pathlib.Path(folder)
            (root / "format").mkdir()
            (root / "format" / "a.cpp").write_text('#include <cstdint>\n#include "api/b.h"\n')
            files, found = check_rooms.check_tree(root)
        self.assertEqual(files, 1)
        self.assertEqual(found, ["format/a.cpp:2: format must not include api/b.h"])

    def test_looks_at_no_packages_of_others(self):
        with tempfile.TemporaryDirectory() as root:
            package = pathlib.Path(root) / "web" / "node_modules" / "one"
            package.mkdir(parents=True)
            (package / "one.h").write_text("#include <unistd.h>\n")
            self.assertEqual(check_rooms.check_tree(pathlib.Path(root)), (0, []))

    def test_fails_on_an_empty_tree(self):
        with tempfile.TemporaryDirectory() as folder:
            self.assertEqual(check_rooms.main([folder]), 1)


if __name__ == "__main__":
    unittest.main()
