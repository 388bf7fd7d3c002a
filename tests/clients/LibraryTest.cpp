// SPDX-License-Identifier: Apache-2.0
// The C library where no service answers: what its calls say, what they keep, and their bounds.
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstring>
#include <thread>
#include <vector>

#include "tests/clients/LibraryFixture.h"
#include "tests/host/ScratchFolder.h"

namespace tarn::reporting {
namespace {

class TarnReportingLibrary : public LibraryFixture {
 protected:
  testing::ScratchFolder folder_;
  const std::string nobody_ = folder_.file("nobody");
};

TEST_F(TarnReportingLibrary, KeepsWhatIsPostedWhileThereIsNoService) {
  openAll(nobody_);
  EXPECT_EQ(post(1), TARNREPORTING_OK);
  EXPECT_EQ(post(2), TARNREPORTING_OK);
  EXPECT_EQ(state().posted, 2U);
  EXPECT_EQ(state().taken, 0U);
  EXPECT_EQ(state().connection, static_cast<std::uint32_t>(TARNREPORTING_CONNECTING));
  EXPECT_EQ(close(20), 2U);
}

TEST_F(TarnReportingLibrary, TellsWhyItIsNotConnected) {
  openAt(nobody_);
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(5);
  while (state().last_error[0] == '\0' && std::chrono::steady_clock::now() < deadline) {
    std::this_thread::yield();
  }
  EXPECT_EQ(std::string(state().last_error).find("no service answers"), 0U) << state().last_error;
}

TEST_F(TarnReportingLibrary, AFullRingDropsTheNewestAndCountsIt) {
  openAll(nobody_, 4096);
  int posted = 0;
  while (post(posted) == TARNREPORTING_OK) {
    ++posted;
  }
  // 8 head, 16 message head, 8 number, 16 text: 48 bytes each.
  EXPECT_EQ(posted, 4096 / 48);
  EXPECT_EQ(post(0), TARNREPORTING_DROPPED);
  EXPECT_EQ(state().posted, static_cast<std::uint64_t>(posted));
  EXPECT_EQ(state().dropped, 2U);
}

TEST_F(TarnReportingLibrary, RefusesTextThatIsNotUtf8AtTheCall) {
  openAll(nobody_);
  for (const std::string_view wrong :
       {"\x80", "a\xC3", "\xC0\xAF", "\xED\xA0\x80", "\xF4\x90\x80\x80", "\xF8\x88\x80\x80\x80", "12345678\xFF"}) {
    EXPECT_EQ(post(1, wrong), TARNREPORTING_TEXT) << wrong;
  }
  for (const std::string_view right : {"", "\xC3\xA4", "\xE2\x82\xAC", "\xF0\x9F\x8E\xB5", "1234567\xC3\xA4"}) {
    EXPECT_EQ(post(1, right), TARNREPORTING_OK) << right;
  }
  EXPECT_EQ(state().posted, 5U);
}

TEST_F(TarnReportingLibrary, RefusesValuesThatDoNotFitTheShape) {
  openAll(nobody_);
  const tarnreporting_value swapped[] = {text("a"), tarnreporting_integer(1)};
  const tarnreporting_value number[] = {tarnreporting_double(1), text("a")};
  const tarnreporting_value more[] = {tarnreporting_integer(1), text("a"), text("b")};
  EXPECT_EQ(tarnreporting_post(writer_, shape_, swapped, 2), TARNREPORTING_KIND);
  EXPECT_EQ(tarnreporting_post(writer_, shape_, number, 2), TARNREPORTING_KIND);
  EXPECT_EQ(tarnreporting_post(writer_, shape_, more, 3), TARNREPORTING_KIND);
  EXPECT_EQ(tarnreporting_post(writer_, shape_, more, 1), TARNREPORTING_KIND);
  EXPECT_EQ(state().posted, 0U);
}

TEST_F(TarnReportingLibrary, ATextMayHave1024BytesAndNotMore) {
  openAll(nobody_);
  EXPECT_EQ(post(1, std::string(1024, 'a')), TARNREPORTING_OK);
  EXPECT_EQ(post(1, std::string(1025, 'a')), TARNREPORTING_TOO_LARGE);
}

TEST_F(TarnReportingLibrary, AMessageMayTakeAQuarterOfItsRing) {
  openAll(nobody_, 4096);
  // 8 head, 16 message head, 8 number, 8 length: 984 bytes are left.
  EXPECT_EQ(post(1, std::string(984, 'a')), TARNREPORTING_OK);
  EXPECT_EQ(post(1, std::string(985, 'a')), TARNREPORTING_TOO_LARGE);
}

TEST_F(TarnReportingLibrary, RefusesShapesThatCannotBe) {
  openAt(nobody_);
  beginSession();
  const tarnreporting_key twice[] = {{"a", TARNREPORTING_INTEGER}, {"a", TARNREPORTING_DOUBLE}};
  const tarnreporting_key unknown[] = {{"a", 99}};
  const tarnreporting_key notText[] = {{"\xFF", TARNREPORTING_INTEGER}};
  const std::string longName(256, 'a');
  const tarnreporting_key tooLong[] = {{longName.c_str(), TARNREPORTING_INTEGER}};
  const std::pair<tarnreporting_shape_options, int> rows[] = {
      {{sizeof(tarnreporting_shape_options), 4, 1, twice, 2}, TARNREPORTING_ARGUMENT},
      {{sizeof(tarnreporting_shape_options), 4, 1, unknown, 1}, TARNREPORTING_KIND},
      {{sizeof(tarnreporting_shape_options), 4, 1, notText, 1}, TARNREPORTING_TEXT},
      {{sizeof(tarnreporting_shape_options), 4, 1, tooLong, 1}, TARNREPORTING_TOO_LARGE},
      {{sizeof(tarnreporting_shape_options), 4, 65536, twice, 1}, TARNREPORTING_ARGUMENT},
      {{sizeof(tarnreporting_shape_options), 4, 1, nullptr, 1}, TARNREPORTING_ARGUMENT},
      {{sizeof(tarnreporting_shape_options), 4, 1, twice, 65}, TARNREPORTING_TOO_LARGE}};
  for (const auto& [options, result] : rows) {
    EXPECT_EQ(tarnreporting_shape_declare(session_, &options, &shape_), result);
  }
}

TEST_F(TarnReportingLibrary, AConnectionHas1024Shapes) {
  openAt(nobody_);
  beginSession();
  for (int i = 0; i < 1024; ++i) {
    declareShape();
  }
  const tarnreporting_shape_options options = {sizeof options, 4, 1, nullptr, 0};
  EXPECT_EQ(tarnreporting_shape_declare(session_, &options, &shape_), TARNREPORTING_TOO_LARGE);
}

TEST_F(TarnReportingLibrary, AClientHas32Writers) {
  openAt(nobody_);
  for (int i = 0; i < 32; ++i) {
    openWriter(4096);
  }
  EXPECT_EQ(tarnreporting_writer_open(client_, nullptr, &writer_), TARNREPORTING_TOO_LARGE);
}

TEST_F(TarnReportingLibrary, RingsHaveAPowerOfTwoWithinTheBounds) {
  openAt(nobody_);
  for (const std::uint32_t bytes : {2048U, 5000U, 2097152U}) {
    const tarnreporting_writer_options options = {sizeof options, bytes, 0};
    EXPECT_EQ(tarnreporting_writer_open(client_, &options, &writer_), TARNREPORTING_ARGUMENT) << bytes;
  }
}

TEST_F(TarnReportingLibrary, StructsMayBeOlderOrNewer) {
  struct Newer {
    tarnreporting_writer_options known;
    std::uint64_t unknown;
  };
  openAt(nobody_);
  Newer newer = {{sizeof newer, 4096, 0}, 0};
  EXPECT_EQ(tarnreporting_writer_open(client_, &newer.known, &writer_), TARNREPORTING_OK);
  newer.unknown = 1;
  EXPECT_EQ(tarnreporting_writer_open(client_, &newer.known, &writer_), TARNREPORTING_ARGUMENT);
  const tarnreporting_writer_options older = {sizeof(std::size_t), 4097, 99};
  EXPECT_EQ(tarnreporting_writer_open(client_, &older, &writer_), TARNREPORTING_OK);
  const tarnreporting_writer_options none = {0, 0, 0};
  EXPECT_EQ(tarnreporting_writer_open(client_, &none, &writer_), TARNREPORTING_ARGUMENT);
}

TEST_F(TarnReportingLibrary, NullPointersAreAnError) {
  EXPECT_EQ(tarnreporting_client_open(nullptr, nullptr), TARNREPORTING_ARGUMENT);
  EXPECT_EQ(tarnreporting_client_close(nullptr, 0, nullptr), TARNREPORTING_ARGUMENT);
  EXPECT_EQ(tarnreporting_post(nullptr, nullptr, nullptr, 0), TARNREPORTING_ARGUMENT);
  EXPECT_EQ(tarnreporting_session_end(nullptr), TARNREPORTING_ARGUMENT);
  openAll(nobody_);
  EXPECT_EQ(tarnreporting_post(writer_, shape_, nullptr, 2), TARNREPORTING_ARGUMENT);
}

TEST_F(TarnReportingLibrary, AWriterAndAShapeOfDifferentClientsDoNotGoTogether) {
  openAll(nobody_);
  tarnreporting_client* const first = client_;
  openAt(nobody_);
  openWriter();
  EXPECT_EQ(post(1), TARNREPORTING_ARGUMENT);
  // Done once the helper has found nobody, for which it is given the time.
  EXPECT_EQ(tarnreporting_client_close(first, 30000, nullptr), TARNREPORTING_OK);
}

TEST_F(TarnReportingLibrary, InAForkedChildEveryHandleSaysSo) {
  openAll(nobody_);
  ASSERT_EQ(post(1), TARNREPORTING_OK);
  const pid_t child = ::fork();
  if (child == 0) {
    const tarnreporting_shape_options options = {sizeof options, 4, 1, nullptr, 0};
    tarnreporting_state state = {};
    state.size = sizeof state;
    int same = 0;
    for (const int result :
         {post(2), tarnreporting_client_flush(client_, 0), tarnreporting_client_state(client_, &state),
          tarnreporting_session_end(session_), tarnreporting_shape_declare(session_, &options, &shape_),
          tarnreporting_writer_close(writer_), tarnreporting_client_close(client_, 0, nullptr)}) {
      same += result == TARNREPORTING_FORKED ? 1 : 0;
    }
    ::_exit(same);
  }
  int status = 0;
  ASSERT_EQ(::waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFEXITED(status));
  EXPECT_EQ(WEXITSTATUS(status), 7);
  EXPECT_EQ(post(3), TARNREPORTING_OK);
  EXPECT_EQ(state().posted, 2U);
}

TEST_F(TarnReportingLibrary, ACloseKeepsItsDeadline) {
  openAll(nobody_);
  ASSERT_EQ(post(1), TARNREPORTING_OK);
  const auto start = std::chrono::steady_clock::now();
  EXPECT_EQ(close(50), 1U);
  EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(50));
  EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(5));
}

TEST_F(TarnReportingLibrary, TwoThreadsOnOneWriterAreToldApart) {
  openAll(nobody_, 1048576);
  const std::string name(1024, 'a');
  std::atomic<std::uint64_t> done{0};
  std::atomic<std::uint64_t> odd{0};
  const auto run = [&] {
    for (int i = 0; i < 400; ++i) {
      const int result = post(i, name);
      ++(result == TARNREPORTING_OK ? done : odd);
      EXPECT_TRUE(result == TARNREPORTING_OK || result == TARNREPORTING_BUSY) << result;
    }
  };
  std::thread other(run);
  run();
  other.join();
  EXPECT_EQ(done.load() + odd.load(), 800U);
  EXPECT_EQ(state().posted, done.load());  // nothing was torn, whoever came first
}

TEST_F(TarnReportingLibrary, EachResultHasAText) {
  for (int result = TARNREPORTING_OK; result <= TARNREPORTING_TIMEOUT; ++result) {
    EXPECT_STRNE(tarnreporting_result_text(result), "unknown") << result;
  }
  EXPECT_STREQ(tarnreporting_result_text(99), "unknown");
}

}  // namespace
}  // namespace tarn::reporting
