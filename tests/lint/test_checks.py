# SPDX-License-Identifier: Apache-2.0
"""Tests of the checks in tools/lint: each rule passes what is right and reports what is wrong, and where."""

import os
import sys
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.join(HERE, "..", "..", "tools", "lint"))

import banned_calls  # noqa: E402
import include_graph  # noqa: E402
import seeds  # noqa: E402
import sizes  # noqa: E402
import statics  # noqa: E402
import wording  # noqa: E402
from tree import Tree, code_only  # noqa: E402

ONCE = "#pragma once\n"


def found(check, files):
    return [(finding.path, finding.line) for finding in check.check(Tree(files))]


class CodeOnly(unittest.TestCase):
    def test_comments_and_literals_become_blanks_and_lines_stay(self):
        code = code_only('int a; // getenv("X")\n/* rand()\n rand() */ auto s = "printf(";\nauto c = \'"\';\nint d;\n')
        self.assertEqual(code.count("\n"), 5)
        for gone in ("getenv", "rand", "printf", '"'):
            self.assertNotIn(gone, code)
        self.assertIn("int d;", code)

    def test_raw_strings_become_blanks(self):
        self.assertNotIn("rand", code_only('auto s = R"x(rand() ")x";\n'))
        self.assertIn("int d", code_only('auto s = R"(")";\nint d;\n'))

    def test_digit_separators_are_no_literals(self):
        self.assertIn("rand()", code_only("int a = 1'000; rand(); int b = 2'000;\n"))

    def test_include_lines_stay_whole(self):
        self.assertIn('"plist/Value.h"', code_only('#include "plist/Value.h"\n'))


class IncludeGraph(unittest.TestCase):
    def test_a_look_down_is_fine(self):
        self.assertEqual(found(include_graph, {
            "plist/Value.h": ONCE + "#include <string>\n",
            "session/TarnReportingSession.h": ONCE + '#include "plist/Value.h"\n',
        }), [])

    def test_a_look_up_is_reported(self):
        self.assertEqual(found(include_graph, {
            "plist/Value.h": ONCE + '#include "session/TarnReportingSession.h"\n',
            "session/TarnReportingSession.h": ONCE,
        }), [("plist/Value.h", 2)])

    def test_worker_families_do_not_know_each_other(self):
        self.assertEqual(found(include_graph, {
            "derived/Segment.h": ONCE,
            "telemetry/rtc/Flush.cpp": '\n#include "derived/Segment.h"\n',
        }), [("telemetry/rtc/Flush.cpp", 2)])

    def test_every_row_looks_only_at_rows_before_it(self):
        rows = list(include_graph.ROOMS)
        for number, room in enumerate(rows):
            with self.subTest(room):
                self.assertLessEqual(set(include_graph.ROOMS[room]) & set(rows), set(rows[:number]))

    def test_every_row_keeps_plist_at_the_bottom(self):
        for room in include_graph.ROOMS:
            if room == "plist":
                continue
            with self.subTest(room):
                self.assertIn(("plist/Value.h", 2), found(include_graph, {
                    "plist/Value.h": ONCE + f'#include "{room}/Other.h"\n', f"{room}/Other.h": ONCE}))

    def test_every_folder_of_the_product_has_a_row_and_every_row_a_folder(self):
        tree = Tree.at(os.path.join(HERE, "..", ".."))
        folders = {os.path.dirname(path) for path in tree.cxx()}
        self.assertEqual([room for room in include_graph.ROOMS if room not in folders], [])

    def test_only_the_entry_point_puts_the_host_and_the_service_together(self):
        files = {"host/loop/MainLoop.h": ONCE, include_graph.ENTRY: '#include "host/loop/MainLoop.h"\n'}
        self.assertEqual(found(include_graph, files), [])
        files["service/TarnReportingService.cpp"] = '#include "host/loop/MainLoop.h"\n'
        self.assertEqual(found(include_graph, files), [("service/TarnReportingService.cpp", 1)])

    def test_only_the_table_of_classes_and_tests_include_a_concrete_worker(self):
        worker = "derived/TarnReportingSessionVolumeWorker"
        line = f'#include "{worker}.h"\n'
        files = {f"{worker}.h": ONCE, f"{worker}.cpp": line}
        for path in ("service/TarnReportingWorkerClasses.cpp", "tests/derived/VolumeTest.cpp"):
            self.assertEqual(found(include_graph, {**files, path: line}), [])
        for path in ("service/TarnReportingService.cpp", "service/main.cpp", "derived/Segment.cpp"):
            self.assertEqual(found(include_graph, {**files, path: line}), [(path, 1)])

    def test_worker_interfaces_are_not_concrete_workers(self):
        self.assertEqual(found(include_graph, {
            "session/TarnReportingSessionWorkerProtocol.h": ONCE,
            "session/TarnReportingSession.cpp": '#include "session/TarnReportingSessionWorkerProtocol.h"\n',
        }), [])

    def test_third_party_headers_belong_beside_the_floors(self):
        line = "#include <sqlite3.h>\n"
        for path in ("plist/formats/Json.cpp", "wire/Encoder.cpp", "client/Socket.cpp",
                     "service/vocabulary/DataSerialize.cpp", "session/Log.cpp", "diagnostics/Pylon.cpp",
                     "testing/FakeClock.cpp"):
            self.assertEqual(found(include_graph, {path: line}), [(path, 1)])
        for path in ("host/log/PrefixedLog.cpp", "recorder/store/Database.cpp", "tools/ctl/Events.cpp",
                     "tests/e2e/RunTest.cpp", "bench/Peers.cpp", "fuzz/FrameFuzzer.cpp"):
            self.assertEqual(found(include_graph, {path: line}), [])

    def test_sockets_are_for_the_client_alone(self):
        line = "#include <sys/socket.h>\n"
        self.assertEqual(found(include_graph, {"client/Socket.cpp": line}), [])
        self.assertEqual(found(include_graph, {"wire/FrameBuffer.cpp": line}), [("wire/FrameBuffer.cpp", 1)])

    def test_public_headers_stand_on_nothing_else_of_ours(self):
        public = {"client/include/tarnkit/Value.h": ONCE}
        line = "#include <tarnkit/Value.h>\n"
        for path in ("client/include/tarnkit/Reply.h", "client/tarnkit/Values.h"):
            self.assertEqual(found(include_graph, {**public, path: ONCE + line}), [])
        self.assertEqual(found(include_graph, {**public, "wire/A.cpp": line}), [("wire/A.cpp", 1)])
        self.assertEqual(found(include_graph, {"plist/Value.h": ONCE, "client/include/tarnkit/Reply.h":
                                               ONCE + '#include "plist/Value.h"\n'}),
                         [("client/include/tarnkit/Reply.h", 2)])
        self.assertEqual(found(include_graph, {"client/tarnkit/A.cpp": "#include <tarnkit/Gone.h>\n"}),
                         [("client/tarnkit/A.cpp", 1)])

    def test_a_circle_is_reported(self):
        self.assertEqual(found(include_graph, {
            "wire/A.h": ONCE + '#include "wire/B.h"\n',
            "wire/B.h": ONCE + '#include "wire/C.h"\n',
            "wire/C.h": ONCE + '\n#include "wire/A.h"\n',
        }), [("wire/C.h", 3)])

    def test_two_roads_to_one_header_are_no_circle(self):
        self.assertEqual(found(include_graph, {
            "wire/A.h": ONCE + '#include "wire/B.h"\n#include "wire/C.h"\n',
            "wire/B.h": ONCE + '#include "wire/C.h"\n',
            "wire/C.h": ONCE,
        }), [])

    def test_a_path_that_is_not_from_the_root_is_reported(self):
        self.assertEqual(found(include_graph, {"plist/Value.h": ONCE, "plist/Value.cpp": '#include "Value.h"\n'}),
                         [("plist/Value.cpp", 1)])

    def test_a_file_outside_the_plan_is_reported(self):
        self.assertEqual(found(include_graph, {"misc/Odd.cpp": "int odd();\n"}), [("misc/Odd.cpp", 1)])

    def test_conditional_code_is_reported_on_portable_floors_only(self):
        text = "int a;\n#ifdef __linux__\n#endif\n"
        self.assertEqual(found(include_graph, {"session/Log.cpp": text}), [("session/Log.cpp", 2)])
        self.assertEqual(found(include_graph, {"host/log/Log.cpp": text}), [])
        self.assertEqual(found(include_graph, {"platform/Log.h": ONCE + text}), [("platform/Log.h", 3)])
        self.assertEqual(found(include_graph, {"plist/ThreadSafety.h": ONCE + text}), [])

    def test_a_header_without_pragma_once_is_reported(self):
        self.assertEqual(found(include_graph, {"plist/Value.h": "int a();\n"}), [("plist/Value.h", 1)])


class BannedCalls(unittest.TestCase):
    BANNED = (
        "std::this_thread::sleep_for(delay);", "::sleep(1);", "usleep(5);",
        "auto t = std::chrono::steady_clock::now();", "auto t = std::chrono::system_clock::now();",
        "auto t = time(nullptr);", "auto t = ::time(&now);", "clock_gettime(CLOCK_REALTIME, &now);",
        "strftime(text, sizeof text, format, &parts);", "auto p = localtime(&now);",
        'auto v = getenv("HOME");', 'auto v = std::getenv("HOME");', "std::ofstream out(path);",
        "std::filesystem::remove(path);", 'auto f = fopen(path, "r");', "int d = ::open(path, flags);",
        "int r = rand();", "int r = std::rand();", "std::random_device device;", "text = strerror(errno);",
        "out << std::endl;", 'std::cout << "x";', 'printf("x");', 'std::fprintf(file, "x");',
        'sprintf(text, "x");', "strcpy(a, b);", "int n = atoi(text);", "auto n = std::strtol(text, nullptr, 10);",
        "auto* p = new Session();", "auto* p = ::new Session();",
        "return new Session();", "delete p;", "delete[] p;", "auto p = malloc(5);",
        "std::thread worker(run);", "auto f = std::async(run);", "exit(1);", "::_exit(1);", 'system("ls");',
        'popen("ls", "r");',
        "std::mutex lock_;", "mutable std::mutex lock_;", "std::recursive_mutex lock_;",
        "const std::lock_guard lock(mutex_);",
        "GTEST_SKIP();", "TEST(A, DISABLED_b) {}", "friend class SessionTest;", "FRIEND_TEST(Session, stops);",
        "using namespace std;",
    )
    FINE = (
        "double time() const;", "void exit(int status);", "clock.time();", "facilities.clock->time(now);",
        "Session(const Session&) = delete;", "void operator delete(void* p);", "#include <new>\n",
        "queue.sleep(5);", "renew(5);",
        "auto* p = ::new (memory) Shared;", "int brand(int a);", "platform::exit(1);", "auto n = newest;",
        '// printf("x")\n', 'auto s = "getenv(";', "std::thread::id id;", "std::time_t t;", "Status open(Path path);",
        "using namespace std::chrono_literals;", "friend class Iterator;", "runtime(nullptr);", "a.free(b);",
    )

    def test_each_banned_call_is_reported_on_its_line(self):
        for call in self.BANNED:
            with self.subTest(call):
                self.assertIn(("session/A.cpp", 3), found(banned_calls, {"session/A.cpp": "\n\n  " + call + "\n"}))

    def test_what_only_looks_alike_is_fine(self):
        for text in self.FINE:
            with self.subTest(text):
                self.assertEqual(found(banned_calls, {"session/A.cpp": "  " + text + "\n"}), [])

    def test_every_ban_is_tried(self):
        code = [code_only(call) for call in self.BANNED]
        for ban in banned_calls.BANS:
            with self.subTest(ban.pattern):
                self.assertTrue(any(ban.regex().search(call) for call in code))

    def test_every_ban_names_a_substitute(self):
        for ban in banned_calls.BANS:
            self.assertTrue(ban.substitute.strip())

    def test_tests_sleep_only_against_the_real_programs_or_under_stress(self):
        text = "std::this_thread::sleep_for(delay);\n"
        for path in ("tests/e2e/RunTest.cpp", "tests/wire/QueueStressTest.cpp"):
            self.assertEqual(found(banned_calls, {path: text}), [])
        for path in ("tests/session/SessionTest.cpp", "host/loop/Loop.cpp", "wire/Encoder.cpp"):
            self.assertEqual(found(banned_calls, {path: text}), [(path, 1)])

    def test_adapters_may_ask_the_clock(self):
        text = "auto t = std::chrono::steady_clock::now();\n"
        for path in ("host/machine/HostClock.cpp", "recorder/Writer.cpp", "client/Waiter.cpp"):
            self.assertEqual(found(banned_calls, {path: text}), [])

    def test_bare_new_is_for_the_packed_values_alone(self):
        text = "auto* p = new Body;\n"
        self.assertEqual(found(banned_calls, {"plist/Packed.cpp": text}), [])
        self.assertEqual(found(banned_calls, {"host/loop/Loop.cpp": text}), [("host/loop/Loop.cpp", 1)])


class Seeds(unittest.TestCase):
    WRONG = (
        "std::random_device device;", "std::mt19937 random(std::random_device{}());", "std::mt19937 random(7);",
        "std::mt19937_64 random{7};", "std::mt19937 random;", "std::minstd_rand random;", "std::mt19937 random{};",
        "shuffle(a, b, std::mt19937{});", "shuffle(a, b, std::mt19937(5));", "std::default_random_engine random;",
    )
    FINE = (
        "std::mt19937 random(seed);", "std::mt19937_64 random(seed + thread);", "std::mt19937& random",
        "explicit Drawn(std::uint64_t seed) : random_(seed) {}\nstd::mt19937 random_;",
        "std::mt19937 random_;\nrandom_.seed(seed);", "shuffle(a, b, std::mt19937(seed));", "// std::mt19937 r(7);",
    )

    def test_an_engine_with_another_seed_is_reported(self):
        for text in self.WRONG:
            with self.subTest(text):
                self.assertIn(("tests/wire/ATest.cpp", 2), found(seeds, {"tests/wire/ATest.cpp": f"\n{text}\n"}))

    def test_an_engine_with_a_given_seed_is_fine(self):
        for text in self.FINE:
            with self.subTest(text):
                self.assertEqual(found(seeds, {"tests/wire/ATest.cpp": f"\n{text}\n"}), [])

    def test_only_tests_are_looked_at_and_not_where_seeds_come_from(self):
        for path in ("bench/A.cpp", "host/loop/A.cpp", seeds.SOURCE):
            self.assertEqual(found(seeds, {path: "std::random_device device;\n"}), [])


class Sizes(unittest.TestCase):
    def test_files_at_their_limit_pass_and_one_line_more_does_not(self):
        for path, limit in (("wire/A.h", 250), ("client/include/tarnkit/A.h", 400), ("wire/A.cpp", 400),
                            ("tests/wire/ATest.cpp", 800), ("tools/a.py", 400), ("dev", 400)):
            with self.subTest(path):
                self.assertEqual(found(sizes, {path: "\n" * limit}), [])
                self.assertEqual(found(sizes, {path: "\n" * (limit + 1)}), [(path, limit + 1)])

    def test_folder_of_too_many_units_is_reported_where_a_source_and_its_header_are_one(self):
        full = {f"wire/U{number}{end}": "\n" for number in range(20) for end in (".cpp", ".h")}
        self.assertEqual(found(sizes, full), [])
        self.assertEqual(found(sizes, {**full, "wire/One.h": "\n"}), [("wire", 21)])
        self.assertEqual(found(sizes, {**full, "wire/more/One.h": "\n", "wire/one.py": "\n"}), [])

    def test_interfaces_may_be_many(self):
        self.assertEqual(found(sizes, {f"platform/U{number}.h": "\n" for number in range(40)}), [])

    def test_wide_lines_of_texts_are_reported_but_tables_and_links_are_not(self):
        self.assertEqual(found(sizes, {"docs/a.md": "x" * 120 + "\n" + "y" * 121 + "\n"}), [("docs/a.md", 2)])
        self.assertEqual(found(sizes, {"docs/a.md": "|" + "x" * 130 + "|\n" + "https://" + "x" * 130 + "\n"}), [])


class Statics(unittest.TestCase):
    MUTABLE = (
        "int count = 0;", "int count;", "int count{};", "static int count = 0;", "namespace tarn {\nint count = 0; }",
        "std::string text;", "std::vector<int> list{1, 2};", "int table[4] = {};", "int count(5);", "Text text(\"a\");",
        "std::atomic<int> count{0};", "std::once_flag once;", "std::mutex lock;", "thread_local int depth = 0;",
        "inline int count = 0;", "constinit int count = 0;", "[[maybe_unused]] int count = 0;",
        "const char* name = nullptr;", "Table* const table = make();", "Table& table = make();",
        "const char* names[2];",
        "const std::shared_ptr<Table> table;", "const auto table = std::make_shared<Table>();",
        "std::function<void(int)> handler;", "auto handler = [] { return 1; };", "struct { int a; } state;",
        "static int made = std::invoke([] { return 1; });",
        "int f() { static int count = 0; return ++count; }", "void f() { if (x) { static Table table; } }",
        "void f() { static Table table(argument); }", "void f() { static const auto t = std::make_unique<Table>(); }",
        "Table& f() { static Table* const table = new Table; return *table; }",
        "void f() { run([] { static int count = 0; ++count; }); }", "A::A() : a_{1}, b_{2} { static int count = 0; }",
        "class A { static inline int count = 0; };", "class A { inline static std::atomic<int> count{0}; };",
        "struct A { void f() { static int count = 0; } };", "class A {\n public:\n  static int count;\n};",
        "template <class T>\nvoid f() { static T value; }", "class A { static inline thread_local int count = 0; };",
    )
    FINE = (
        "constexpr int kCount = 1;", "const int kCount = 1;", "constinit const std::atomic<bool> kNever{false};",
        "inline const plist::Key kName{\"name\"};", "constexpr std::array<int, 2> kList{{1, 2}};",
        "constexpr std::size_t kMost = std::size_t{1} << 20U;", "const char* const kName = \"name\";",
        "constexpr const char* kNames[] = {\"a\"};", "const Table& kTable = table();", "extern int count;",
        "constexpr Operations kOperations{[] { return std::make_unique<Table>(); }, [] {}};",
        "const std::shared_ptr<const Table> kTable;",
        "int f();", "static int f(int a);", "std::vector<int> f(const std::function<void()>& work);",
        "auto f() -> std::vector<int>;", "bool operator==(const A& a, const A& b);", "using List = std::vector<int>;",
        "typedef int Count;", "class A;", "enum class A { one, two };", "static_assert(sizeof(int) == 4);",
        "template <class T>\nconstexpr char kTag = 0;", "struct A { int count = 0; std::mutex lock; };",
        "class A { static int f(); static constexpr int kCount = 0; static const int kOther = 1; };",
        "class A { static std::function<void()> f(); };", "class A { A() : a_{1}, b_(2) {} int a_ = 0; int b_; };",
        "void f() { int count = 0; static const plist::Key kKey(\"key\"); static constexpr int kCount = 1; }",
        "int f() {\n  for (int i = 0; i < 3; ++i) {}\n  *p = 1;\n  return 0;\n}\nint g();", "// int count = 0;",
        "#define COUNT int count = 0;\n", "A::A() : a_{1}, b_{2} {}\nint f();", "friend class B;",
    )

    def test_mutable_state_of_the_process_is_reported(self):
        for text in self.MUTABLE:
            with self.subTest(text):
                self.assertEqual(len(found(statics, {"session/A.cpp": text + "\n"})), 1)

    def test_constants_functions_and_members_are_fine(self):
        for text in self.FINE:
            with self.subTest(text):
                self.assertEqual(found(statics, {"session/A.cpp": text + "\n"}), [])

    def test_the_line_is_told_and_lines_after_it_are_seen(self):
        text = "int f() {\n  static int a = 0;\n  return a;\n}\n\nint b = 0;\n"
        self.assertEqual(found(statics, {"host/loop/A.cpp": text}), [("host/loop/A.cpp", 2), ("host/loop/A.cpp", 6)])

    def test_the_home_and_what_is_no_product_may_hold_state(self):
        for path in (statics.HOME, "tests/session/A.cpp", "bench/A.cpp", "fuzz/A.cpp"):
            self.assertEqual(found(statics, {path: "int count = 0;\n"}), [])

    def test_each_exception_is_there_and_has_its_reason(self):
        tree = Tree.at(os.path.join(HERE, "..", ".."))
        for (path, name), reason in statics.EXCEPTIONS.items():
            with self.subTest(path):
                self.assertIn(name, [each for _, each in statics.statics(tree.files[path])])
                self.assertTrue(reason.strip())

    def test_every_folder_of_the_product_is_looked_at(self):
        rooms = [room for room in include_graph.ROOMS if not room.startswith(("examples/", "tests/", "tools/mutate"))]
        self.assertEqual([room for room in rooms if not (room + "/").startswith(statics.PRODUCT)], [])


class Wording(unittest.TestCase):
    def test_paths_of_one_machine_are_reported(self):
        for folder in wording.PRIVATE_ROOTS:
            with self.subTest(folder):
                self.assertEqual(found(wording, {"docs/a.md": f"see\n `/{folder}/anna/tarnkit`\n"}), [("docs/a.md", 2)])

    def test_tests_may_make_up_users_but_name_no_other_private_path(self):
        self.assertEqual(found(wording, {"tests/host/A.cpp": '"/home/u/x"\n"/' + "mnt" + '/u/x"\n'}),
                         [("tests/host/A.cpp", 2)])

    def test_paths_of_any_machine_and_relative_ones_are_fine(self):
        text = "/var/lib/tarnreporting /run/tarnreporting /usr/share\n./work/a x/home/b $XDG_STATE_HOME/data/x\n"
        self.assertEqual(found(wording, {"docs/a.md": text}), [])

    def test_notes_and_stray_bytes_are_reported(self):
        for line in ("// TO" "DO later", "# FIX" "ME", "x ", "x\r", "\tx", "caf\udce9", "<" * 7 + " main"):
            with self.subTest(line):
                self.assertEqual(found(wording, {"wire/A.cpp": "x\n" + line + "\n"}), [("wire/A.cpp", 2)])

    def test_a_last_line_without_newline_is_reported(self):
        self.assertEqual(found(wording, {"docs/a.md": "a\nb"}), [("docs/a.md", 2)])


class TreeOnDisk(unittest.TestCase):
    def test_this_very_tree_is_found_and_build_is_not(self):
        tree = Tree.at(os.path.join(HERE, "..", ".."))
        self.assertIn("tests/lint/test_checks.py", tree.files)
        self.assertIn("plist/Value.h", tree.cxx())
        self.assertFalse([path for path in tree.files if path.startswith("build/")])


if __name__ == "__main__":
    unittest.main()
