// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderRtcReportingService.h"

#include <future>
#include <thread>

#include "testing/ManualWorkQueues.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

using namespace std::chrono_literals;
using Backends = std::optional<std::vector<std::string>>;

class RecorderRtcReportingServiceTest : public RecorderFixture {
 protected:
  using Behaviour = RecorderRtcReportingService::Behaviour;

  std::unique_ptr<RecorderRtcReportingService> makeService(const Behaviour& behaviour) {
    return std::make_unique<RecorderRtcReportingService>(start(), clock_, workQueues_, behaviour);
  }
  static std::shared_ptr<platform::RtcReportingSession> makeSession(RecorderRtcReportingService& service) {
    return service.createSession({}, {}, {});
  }
  // What the completion of a start reports.
  static Backends backendsOf(platform::RtcReportingSession& session) {
    std::promise<Backends> reported;
    session.startConfiguration([&](const Backends& backends) { reported.set_value(backends); });
    return reported.get_future().get();
  }
  std::vector<std::string> rows() {
    EXPECT_TRUE(flush());
    return ask(file(), "SELECT time, backend, name, payload, detail FROM events ORDER BY id");
  }

  tarn::testing::ManualWorkQueues workQueues_{clock_};
};

TEST_F(RecorderRtcReportingServiceTest, RecordsASessionItsMessagesAndItsFlushes) {
  const auto service = makeService({});
  clock_.setEpochSeconds(1763632800.5);
  const auto session = service->createSession({{"clientType", 19}, {"clientVersion", 2.1F}}, {{"clientName", "x"}}, {});
  const auto result = session->sendMessage(0xFFFF, 7, {{"n", 1}});
  EXPECT_TRUE(result.sent);
  EXPECT_TRUE(result.error.ok());
  session->flushMessages();
  EXPECT_EQ(rows(), (std::vector<std::string>{
                        R"(1763632800.5|rtc|createSession|{"sessionInfo":{"clientType":19,"clientVersion":2.1},)"
                        R"("userInfo":{"clientName":"x"}}|{"session":1})",
                        R"(1763632800.5|rtc|sendMessage|{"n":1}|{"session":1,"category":65535,"type":7})",
                        R"(1763632800.5|rtc|flush|{}|{"session":1})"}));
}

TEST_F(RecorderRtcReportingServiceTest, SessionsCountFromOneAndTokensAreTexts) {
  const auto service = makeService({});
  EXPECT_NE(service->newHierarchyToken({}), service->newHierarchyToken({}));
  EXPECT_NE(service->newHierarchyToken("above"), std::nullopt);
  const auto first = makeSession(*service);
  const auto second = makeSession(*service);
  second->flushMessages();
  first->flushMessages();
  EXPECT_NE(first->description(), second->description());
  ASSERT_TRUE(flush());
  EXPECT_EQ(ask(file(), "SELECT name, detail ->> 'session' FROM events ORDER BY id"),
            (std::vector<std::string>{"createSession|1", "createSession|2", "flush|2", "flush|1"}));
}

TEST_F(RecorderRtcReportingServiceTest, UnavailableServiceHandsOutNoToken) {
  const auto service = makeService({.available = false});
  EXPECT_EQ(service->newHierarchyToken({}), std::nullopt);
}

TEST_F(RecorderRtcReportingServiceTest, CompletionReportsTheListAnEmptyOneOrNone) {
  for (const Backends& backends : {Backends({"a", "b"}), Backends(std::vector<std::string>()), Backends()}) {
    const auto service =
        makeService({.backends = backends.value_or(std::vector<std::string>{"unseen"}), .noBackends = !backends});
    EXPECT_EQ(backendsOf(*makeSession(*service)), backends);
  }
}

TEST_F(RecorderRtcReportingServiceTest, AnotherBehaviourHoldsForStartsThatComeAfterIt) {
  const auto service = makeService({.startDelay = 10ms});
  const auto session = makeSession(*service);
  std::vector<Backends> reported;
  const auto note = [&](const Backends& backends) { reported.push_back(backends); };
  session->startConfiguration(note);
  service->setBehaviour({.available = false, .backends = {"other"}});
  session->startConfiguration(note);
  workQueues_.advance(10ms);
  EXPECT_EQ(reported, (std::vector<Backends>{{{"recorder"}}, {{"other"}}}));
  EXPECT_EQ(service->newHierarchyToken({}), std::nullopt);
}

TEST_F(RecorderRtcReportingServiceTest, CompletionWithoutADelayComesWithinTheCall) {
  const auto service = makeService({});
  std::optional<std::thread::id> thread;
  makeSession(*service)->startConfiguration([&](const Backends&) { thread = std::this_thread::get_id(); });
  EXPECT_EQ(thread, std::this_thread::get_id());
}

TEST_F(RecorderRtcReportingServiceTest, LateCompletionComesOnAQueueOfItsOwn) {
  const auto service = makeService({.startDelay = 1ms});
  EXPECT_TRUE(workQueues_.names().empty());
  int calls = 0;
  makeSession(*service)->startConfiguration([&](const Backends&) { ++calls; });
  makeSession(*service)->startConfiguration([&](const Backends&) { ++calls; });
  EXPECT_EQ(workQueues_.names().size(), 1U);
  EXPECT_EQ(calls, 0);
  workQueues_.advance(1ms);
  EXPECT_EQ(calls, 2);
}

TEST_F(RecorderRtcReportingServiceTest, CompletionComesByItsDelayNeverEarlyAndInOrder) {
  const auto service = makeService({.startDelay = 30ms});
  std::vector<int> order;
  for (int i = 0; i < 10; ++i) {
    makeSession(*service)->startConfiguration([&order, i](const Backends&) { order.push_back(i); });
  }
  workQueues_.advance(30ms - 1ns);
  EXPECT_TRUE(order.empty());
  workQueues_.advance(1ns);
  EXPECT_EQ(order, (std::vector<int>{0, 1, 2, 3, 4, 5, 6, 7, 8, 9}));
}

TEST_F(RecorderRtcReportingServiceTest, CompletionThatHasNotComeIsDestroyedWithTheService) {
  auto service = makeService({.startDelay = 1h});
  const auto session = makeSession(*service);
  const auto held = std::make_shared<int>(0);
  session->startConfiguration([held](const Backends&) { ADD_FAILURE(); });
  EXPECT_EQ(held.use_count(), 2);
  service.reset();
  EXPECT_EQ(held.use_count(), 1);
  session->startConfiguration([held](const Backends&) { ADD_FAILURE(); });
  EXPECT_EQ(held.use_count(), 1);
  EXPECT_TRUE(session->sendMessage(1, 1, {}).sent);
}

TEST_F(RecorderRtcReportingServiceTest, SessionMayBeUsedFromAnyThread) {
  const auto service = makeService({});
  std::vector<std::thread> threads;
  for (int thread = 0; thread < 4; ++thread) {
    threads.emplace_back([&] {
      const auto session = makeSession(*service);
      static_cast<void>(backendsOf(*session));
      for (int i = 0; i < 200; ++i) {
        EXPECT_TRUE(session->sendMessage(1, 1, {{"n", i}}).sent);
      }
    });
  }
  for (auto& thread : threads) {
    thread.join();
  }
  ASSERT_TRUE(flush());
  EXPECT_EQ(ask(file(),
                "SELECT detail ->> 'session', count(*), max(payload ->> 'n') FROM events "
                "WHERE name = 'sendMessage' GROUP BY 1 ORDER BY 1"),
            (std::vector<std::string>{"1|200|199", "2|200|199", "3|200|199", "4|200|199"}));
}

}  // namespace
}  // namespace tarn::recorder
