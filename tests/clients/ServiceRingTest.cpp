// SPDX-License-Identifier: Apache-2.0
// The C library with the real service: order, deaths, restarts, and what an idle pair costs.
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "tests/clients/ServiceRingFixture.h"

namespace tarn::reporting {
namespace {

TEST_F(ServiceRing, WhatIsPostedIsRecordedInItsOrderWithItsValues) {
  ASSERT_TRUE(startService());
  library_.openAll(socket());
  postAll(0, 2000);
  EXPECT_EQ(recorded(2000), count(0, 2000));
  const auto events = this->events(kName);
  EXPECT_EQ(events.front().payload.at("name"), "a");
  EXPECT_EQ(events.front().payload.at("HostApplicationDisplayID"), "sys.oxbow.music");
  EXPECT_GT(events.front().payload.at("tarnreporting_timestamp"), 1.7e9);
  EXPECT_EQ(library_.close(5000), 0U);
}

TEST_F(ServiceRing, TellsWhatIsTakenAndCommitted) {
  ASSERT_TRUE(startService());
  library_.openAll(socket());
  postAll(0, 500);
  EXPECT_TRUE(e2e::eventually([&] { return library_.state().committed == 500; })) << library_.state().committed;
  EXPECT_EQ(library_.state().taken, 500U);
  EXPECT_GE(events(kName).size(), 500U);  // committed means that it is there to be read
  EXPECT_EQ(status().at("ring_messages_received"), 500);
}

TEST_F(ServiceRing, AnEndedSessionStopsAfterItsLastMessage) {
  ASSERT_TRUE(startService());
  library_.openAll(socket());
  postAll(0, 1000);
  ASSERT_EQ(tarnreporting_session_end(library_.session_), TARNREPORTING_OK);
  EXPECT_TRUE(e2e::eventually([&] { return recorded(1000).size() == 1000; }));
  EXPECT_EQ(library_.close(5000), 0U);
  EXPECT_TRUE(e2e::eventually([&] { return status().at("connections_open") == 1; }));
  EXPECT_EQ(status().at("connections_cut").at("reset"), 0);
}

TEST_F(ServiceRing, AWriterThatIsClosedIsReadToItsEnd) {
  ASSERT_TRUE(startService());
  library_.openAll(socket());
  postAll(0, 100);
  ASSERT_EQ(tarnreporting_writer_close(library_.writer_), TARNREPORTING_OK);
  EXPECT_EQ(recorded(100), count(0, 100));
  EXPECT_TRUE(e2e::eventually([&] { return status().at("rings_open") == 0; })) << status().dump();
  EXPECT_EQ(library_.state().posted, 100U);
}

TEST_F(ServiceRing, WhatWasPostedBeforeTheServiceStartedIsRecorded) {
  library_.openAll(socket());
  postAll(0, 300);
  ASSERT_TRUE(startService());
  EXPECT_EQ(recorded(300), count(0, 300));
}

TEST_F(ServiceRing, AKilledProgramLosesNothingThatItHadPosted) {
  ASSERT_TRUE(startService());
  std::int64_t total = 0;
  for (int round = 0; round < 20; ++round) {
    int pipe[2];
    ASSERT_EQ(::pipe(pipe), 0);
    const pid_t child = ::fork();
    if (child == 0) {
      const auto library = std::make_unique<Library>();
      library->openAll(socket());
      std::int64_t posted = library->post(-1) == TARNREPORTING_OK ? 1 : 0;
      tarnreporting_client_flush(library->client_, 5000);  // the service has opened the ring
      ::usleep(static_cast<unsigned>(500 * round));
      for (int i = 0; i < 1000 + 37 * round; ++i) {
        posted += library->post(i) == TARNREPORTING_OK ? 1 : 0;
      }
      [[maybe_unused]] const ssize_t written = ::write(pipe[1], &posted, sizeof posted);
      ::kill(::getpid(), SIGKILL);
    }
    std::int64_t posted = -1;
    EXPECT_EQ(::read(pipe[0], &posted, sizeof posted), static_cast<ssize_t>(sizeof posted));
    ::close(pipe[0]);
    ::close(pipe[1]);
    ::waitpid(child, nullptr, 0);
    total += posted;
    EXPECT_TRUE(e2e::eventually([&] { return status().at("ring_messages_received") == total; }))
        << "round " << round << ": " << status().at("ring_messages_received") << " of " << total;
  }
  EXPECT_TRUE(e2e::eventually([&] { return status().at("rings_open") == 0; }));
}

TEST_F(ServiceRing, AfterARestartTheSessionsAreMadeAnewAndNothingPostedMeanwhileIsLost) {
  ASSERT_TRUE(startService());
  library_.openAll(socket());
  postAll(0, 100);
  ASSERT_TRUE(e2e::eventually([&] { return library_.state().committed == 100; }));
  service().signal(SIGKILL);
  service().wait();
  postAll(100, 200);
  ASSERT_TRUE(startService());
  EXPECT_EQ(recorded(200), count(0, 200));
  EXPECT_EQ(events(kName).back().payload.at("HostApplicationDisplayID"), "sys.oxbow.music");
  EXPECT_EQ(library_.state().connections, 2U);
  EXPECT_EQ(library_.close(5000), 0U);
}

TEST_F(ServiceRing, AStoppedServiceDoesNotHoldUpAPost) {
  ASSERT_TRUE(startService());
  library_.openAll(socket(), 65536);
  postAll(0, 10);
  ASSERT_EQ(recorded(10).size(), 10U);
  service().signal(SIGSTOP);
  std::uint64_t dropped = 0;
  auto worst = std::chrono::steady_clock::duration::zero();
  for (int i = 0; i < 20000; ++i) {
    const auto start = std::chrono::steady_clock::now();
    dropped += library_.post(i) == TARNREPORTING_DROPPED ? 1U : 0U;
    worst = std::max(worst, std::chrono::steady_clock::now() - start);
  }
  service().signal(SIGCONT);
  EXPECT_GT(dropped, 0U);
  EXPECT_LT(worst, std::chrono::milliseconds(200));  // as far as a shared machine lets one tell
  EXPECT_TRUE(e2e::eventually([&] { return library_.state().taken == library_.state().posted; }));
  EXPECT_TRUE(e2e::eventually([&] { return status().at("messages_dropped_by_client") == dropped; }));
  EXPECT_EQ(library_.post(0), TARNREPORTING_OK);
  EXPECT_TRUE(e2e::eventually([&] { return status().at("ring_gaps") == 1; }));
}

TEST_F(ServiceRing, AQuietRingWakesTheService) {
  ASSERT_TRUE(startService());
  library_.openAll(socket());
  for (std::int64_t number = 0; number < 3; ++number) {
    std::this_thread::sleep_for(std::chrono::milliseconds(1200));
    postAll(number, number + 1);
    ASSERT_TRUE(e2e::eventually([&] { return library_.state().taken == static_cast<std::uint64_t>(number + 1); }));
  }
  EXPECT_EQ(recorded(3), count(0, 3));
}

TEST_F(ServiceRing, AWriterThatMayNotWakeIsLookedAfter) {
  ASSERT_TRUE(startService());
  library_.openAll(socket(), 0, TARNREPORTING_NO_SYSTEM_CALL);
  std::this_thread::sleep_for(std::chrono::milliseconds(1200));
  postAll(0, 1);
  EXPECT_EQ(recorded(1), count(0, 1));
}

// How often the threads of a process went to sleep by themselves so far, but for that one.
std::int64_t sleeps(pid_t process, pid_t butThread = 0) {
  std::int64_t total = 0;
  const std::string tasks = "/proc/" + std::to_string(process) + "/task";
  for (const auto& entry : std::filesystem::directory_iterator(tasks)) {
    if (entry.path().filename() == std::to_string(butThread)) continue;
    const std::string text = e2e::contentOf(entry.path() / "status");
    const std::size_t at = text.find("\nvoluntary_ctxt_switches:");
    total += at == std::string::npos ? 0 : std::stoll(text.substr(at + 25));
  }
  return total;
}

// Whether neither the service nor the library's threads wake up for two seconds.
bool nobodyWakes(pid_t service) {
  const std::int64_t servicesBefore = sleeps(service);
  const std::int64_t librarysBefore = sleeps(::getpid(), ::gettid());
  std::this_thread::sleep_for(std::chrono::seconds(2));
  return sleeps(service) == servicesBefore && sleeps(::getpid(), ::gettid()) == librarysBefore;
}

TEST_F(ServiceRing, FiftyQuietRingsWakeNobody) {
  ASSERT_TRUE(startService());
  std::vector<std::unique_ptr<Library>> clients;
  for (int i = 0; i < 5; ++i) {
    clients.push_back(std::make_unique<Library>());
    clients.back()->openAll(socket(), 4096);
    for (int writer = 1; writer < 10; ++writer) {
      clients.back()->openWriter(4096);
    }
    clients.back()->post(i);
  }
  ASSERT_EQ(recorded(5).size(), 5U);
  ASSERT_TRUE(e2e::eventually([&] { return status().at("rings_open") == 50; }));
  // Not at once: the rings' readers sleep after a second, and the recorder tidies up after what came.
  EXPECT_TRUE(e2e::eventually([this] { return nobodyWakes(service().id()); }));
  const std::int64_t before = sleeps(service().id());
  clients.front()->post(5);
  EXPECT_TRUE(e2e::eventually([&] { return sleeps(service().id()) > before; }));  // it is seen when somebody does
  EXPECT_EQ(status().at("rings_open"), 50);
}

TEST_F(ServiceRing, ARefusalIsDeliveredWithItsText) {
  ASSERT_TRUE(startService());
  std::atomic<int> told{0};
  tarnreporting_field twice[] = {{"a", tarnreporting_integer(1)}, {"a", tarnreporting_integer(2)}};
  tarnreporting_session_options options = {};
  options.size = sizeof options;
  options.configuration = twice;
  options.configuration_count = 2;
  tarnreporting_client* client = nullptr;
  tarnreporting_client_options clientOptions = {};
  clientOptions.size = sizeof clientOptions;
  const std::string path = socket();
  clientOptions.socket_path = path.c_str();
  clientOptions.on_refusal = [](void* context, const char* text) {
    *static_cast<std::atomic<int>*>(context) += std::string(text).find("setConfiguration") == 0 ? 1 : 0;
  };
  clientOptions.context = &told;
  ASSERT_EQ(tarnreporting_client_open(&clientOptions, &client), TARNREPORTING_OK);
  tarnreporting_session* session = nullptr;
  ASSERT_EQ(tarnreporting_session_begin(client, &options, &session), TARNREPORTING_OK);
  tarnreporting_state state = {};
  state.size = sizeof state;
  EXPECT_TRUE(e2e::eventually([&] { return tarnreporting_client_state(client, &state) == 0 && state.refused == 1; }));
  EXPECT_EQ(std::string(state.last_error).find("setConfiguration: not a property list"), 0U) << state.last_error;
  EXPECT_EQ(tarnreporting_client_close(client, 5000, nullptr), TARNREPORTING_OK);
  EXPECT_EQ(told, 1);
}

}  // namespace
}  // namespace tarn::reporting
