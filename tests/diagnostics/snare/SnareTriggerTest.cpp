// SPDX-License-Identifier: Apache-2.0
// When a fault detector fires: the decisions by themselves, and the worker that keeps the rule with instances of the
// test's own.
#include <functional>
#include <limits>

#include "tests/diagnostics/snare/SnareFixture.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::chrono_literals;
using Verdict = TarnReportingSnareVerdict;

constexpr double kNow = 1750000000.0;

TEST(WorkerInstanceState, AsMadeItHasNothingAndThresholdsThatNothingReaches) {
  const WorkerInstanceState state;
  EXPECT_FALSE(state.currentSnareSessionIdentifier->get());
  EXPECT_EQ(state.interestedCount, 0U);
  EXPECT_EQ(state.interestThresholdCount, 18446744073709551615U);
  EXPECT_FALSE(state.interestFirstSeen.get());
  EXPECT_EQ(state.interestThresholdDurationSeconds, 1.7976931348623157e308);
  EXPECT_FALSE(state.oncePerSession);
  EXPECT_EQ(state.firedCount, 0U);
  EXPECT_EQ(state.lastMessage, nullptr);
  EXPECT_EQ(state.symptomReporter, nullptr);
}

TEST(WorkerInstanceState, AsMadeItNeverFires) {
  WorkerInstanceState state;
  state.count(kNow);
  EXPECT_EQ(state.verdict(kNow + 1e9), Verdict::TooFew);
  state.interestedCount = std::numeric_limits<std::uint64_t>::max() - 1;
  EXPECT_EQ(state.verdict(kNow + 1e9), Verdict::TooFew);
}

TEST(WorkerInstanceState, ACountFiresFromItsThresholdOn) {
  WorkerInstanceState state;
  state.interestThresholdCount = 5;
  state.interestThresholdDurationSeconds = 60;
  for (std::uint64_t count = 0; count < 8; ++count) {
    state.interestedCount = count;
    EXPECT_EQ(state.verdict(kNow), count < 5 ? Verdict::TooFew : Verdict::Fire) << count;
  }
}

TEST(WorkerInstanceState, WithoutACountOnlyMoreThanTheTimeFires) {
  WorkerInstanceState state;
  state.interestThresholdCount = 0;
  state.interestThresholdDurationSeconds = 60;
  state.count(kNow);
  EXPECT_EQ(state.verdict(kNow), Verdict::TooSoon);
  EXPECT_EQ(state.verdict(kNow + 59), Verdict::TooSoon);
  EXPECT_EQ(state.verdict(kNow + 60), Verdict::TooSoon);
  EXPECT_EQ(state.verdict(kNow + 60.0001), Verdict::Fire);
  EXPECT_EQ(state.verdict(kNow - 3600), Verdict::TooSoon);  // the clock was set back
}

TEST(WorkerInstanceState, ATimeOfNothingStillWantsSomeToPass) {
  WorkerInstanceState state;
  state.interestThresholdCount = 0;
  state.interestThresholdDurationSeconds = 0;
  state.count(kNow);
  EXPECT_EQ(state.verdict(kNow), Verdict::TooSoon);
  EXPECT_EQ(state.verdict(kNow + 0.001), Verdict::Fire);
}

TEST(WorkerInstanceState, TheTimeCountsFromTheFirstInterest) {
  WorkerInstanceState state;
  state.count(kNow);
  state.count(kNow + 10);
  EXPECT_EQ(state.interestFirstSeen.get(), kNow);
  EXPECT_EQ(state.interestedCount, 2U);
}

TEST(WorkerInstanceState, OncePerSessionHoldsBackWhileItHasFired) {
  WorkerInstanceState state;
  state.interestThresholdCount = 1;
  state.oncePerSession = true;
  state.count(kNow);
  EXPECT_EQ(state.verdict(kNow), Verdict::Fire);
  state.firedCount = 1;
  EXPECT_EQ(state.verdict(kNow), Verdict::FiredBefore);
  state.oncePerSession = false;
  EXPECT_EQ(state.verdict(kNow), Verdict::Fire);
}

TEST(WorkerInstanceState, ResetForgetsAllButHowOftenItFiredAndWhatCameOfIt) {
  WorkerInstanceState state;
  state.count(kNow);
  state.firedCount = 3;
  state.currentSnareSessionIdentifier->set("capture");
  state.lastMessage = std::make_shared<TarnReportingSessionMessage>(
      plist::Dictionary{{"n", 1}}, AudioEventCategory::Generic, AudioEventType::Generic);
  state.reset();
  EXPECT_EQ(state.interestedCount, 0U);
  EXPECT_FALSE(state.interestFirstSeen.get());
  EXPECT_EQ(state.lastMessage, nullptr);
  EXPECT_EQ(state.firedCount, 3U);
  EXPECT_EQ(state.currentSnareSessionIdentifier->get(), "capture");
}

TEST(WorkerInstanceState, ARepeatIsEqualValueByValueWhateverTheOrder) {
  WorkerInstanceState state;
  const plist::Array list{1, "two"};
  EXPECT_FALSE(state.repeatsLastMessage({}));  // nothing came yet
  state.lastMessage = std::make_shared<TarnReportingSessionMessage>(
      plist::Dictionary{{"a", 1}, {"list", list}}, AudioEventCategory::Generic, AudioEventType::Generic);
  EXPECT_TRUE(state.repeatsLastMessage({{"list", list}, {"a", 1.0}}));
  EXPECT_FALSE(state.repeatsLastMessage({{"a", 1}, {"list", plist::Array{1, "Two"}}}));
  EXPECT_FALSE(state.repeatsLastMessage({{"a", 1}}));
  EXPECT_FALSE(state.repeatsLastMessage({{"a", 1}, {"list", list}, {"more", 1}}));
  EXPECT_FALSE(state.repeatsLastMessage({}));
}

TEST(WorkerInstanceState, WithoutACountAndWithoutAnInterestItIsTooSoon) {
  WorkerInstanceState state;
  state.interestThresholdCount = 0;
  state.interestThresholdDurationSeconds = 60;
  EXPECT_EQ(state.verdict(kNow), Verdict::TooSoon);
}

TEST(WorkerInstanceState, FiredOftenAndOncePerSessionNeverFires) {
  WorkerInstanceState state;
  state.interestThresholdCount = 1;
  state.oncePerSession = true;
  state.firedCount = 2;
  state.count(kNow);
  EXPECT_EQ(state.verdict(kNow), Verdict::FiredBefore);
}

// What the instances below do and how they are set up; fresh for each test.
struct ProbeScript {
  std::uint64_t thresholdCount = 2;
  double thresholdSeconds = 60;
  bool once = false;
  std::vector<std::string> trail;                     // "Name verb n"
  std::function<void(const std::string& verb)> look;  // called in each operation of WholeProbe
};
ProbeScript& probes() {
  static ProbeScript instance;
  return instance;
}

template <class Self>
class Probe : public TarnReportingSnareWorkerInstance {
 public:
  using TarnReportingSnareWorkerInstance::TarnReportingSnareWorkerInstance;
  static std::unique_ptr<Self> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    auto state = std::make_shared<WorkerInstanceState>();
    state->interestThresholdCount = probes().thresholdCount;
    state->interestThresholdDurationSeconds = probes().thresholdSeconds;
    state->oncePerSession = probes().once;
    return std::make_unique<Self>(session, std::move(state));
  }
  bool interestedInMessage(const TarnReportingSessionMessage& message) const override {
    return message.message().contains("n");
  }

 protected:
  static void look(const std::string& verb) {
    if (probes().look) {
      probes().look(verb);
    }
  }
  static void note(const std::string& verb, const TarnReportingSessionMessage& message) {
    probes().trail.push_back(std::string(Self::kClassName) + " " + verb + " " + message.message()["n"].asText());
    look(verb);
  }
};

class WholeProbe : public Probe<WholeProbe> {
 public:
  static constexpr std::string_view kClassName = "WholeProbe";
  using Probe::Probe;
  static bool handleSingleMessageSession() { return true; }
  void handleMessage(const TarnReportingSessionMessage& message) { note("handle", message); }
  void fire(const TarnReportingSessionMessage& message) { note("fire", message); }
  void start() {
    probes().trail.emplace_back("WholeProbe start");
    look("start");
  }
  void stop() {
    probes().trail.emplace_back("WholeProbe stop");
    look("stop");
  }
};

class FiringProbe : public Probe<FiringProbe> {
 public:
  static constexpr std::string_view kClassName = "FiringProbe";
  using Probe::Probe;
  static bool handleSingleMessageSession() { return false; }
  void fire(const TarnReportingSessionMessage& message) { note("fire", message); }
};

class CountingProbe : public Probe<CountingProbe> {
 public:
  static constexpr std::string_view kClassName = "CountingProbe";
  using Probe::Probe;
};

class DecliningProbe : public Probe<DecliningProbe> {
 public:
  static constexpr std::string_view kClassName = "DecliningProbe";
  using Probe::Probe;
  static std::unique_ptr<DecliningProbe> initWithSession(const std::shared_ptr<TarnReportingSession>&) {
    return nullptr;
  }
};

class SnareTrigger : public SnareFixture {
 protected:
  SnareTrigger() {
    probes() = {};
    session_->setServiceType(AudioServiceType::Generic);
  }
  ~SnareTrigger() override { probes() = {}; }

  template <class... Probes>
  void useProbes() {
    (worker_.addInstance(Worker::InstanceClass::of<Probes>()), ...);
  }
  void handle(int n) { worker_.handleMessage(message({{"n", n}})); }
  void handleAll(std::initializer_list<int> numbers) {
    for (const int n : numbers) {
      handle(n);
    }
  }
  WorkerInstanceState& state(std::size_t place = 0) const {
    return worker_.instances().at(place).instance->workerState();
  }
  const std::vector<std::string>& trail() const { return probes().trail; }

  Session session_ = makeSession();
  Worker worker_{session_};
};

TEST_F(SnareTrigger, WithACountOfTwoTheFirstCountsAndTheSecondFires) {
  useProbes<FiringProbe>();
  handle(1);
  EXPECT_EQ(state().interestedCount, 1U);
  EXPECT_TRUE(trail().empty());
  handle(2);
  EXPECT_EQ(trail(), (std::vector<std::string>{"FiringProbe fire 2"}));
  EXPECT_EQ(state().interestedCount, 0U);
  EXPECT_EQ(state().firedCount, 1U);
  EXPECT_FALSE(state().interestFirstSeen.get());
  EXPECT_EQ(state().lastMessage, nullptr);
}

TEST_F(SnareTrigger, WithoutACountTheFirstMessageBehindTheTimeFires) {
  probes().thresholdCount = 0;
  useProbes<FiringProbe>();
  handle(1);
  platform_.advance(30s);
  handle(2);
  platform_.advance(30s);
  handle(3);  // 60 seconds, not more
  EXPECT_TRUE(trail().empty());
  EXPECT_EQ(state().interestedCount, 3U);
  platform_.advance(1ms);
  handle(4);
  EXPECT_EQ(trail(), (std::vector<std::string>{"FiringProbe fire 4"}));
  handle(5);  // the time starts again
  EXPECT_EQ(trail().size(), 1U);
  EXPECT_EQ(state().interestedCount, 1U);
}

TEST_F(SnareTrigger, ACountLeavesTheTimeAside) {
  useProbes<FiringProbe>();
  handle(1);
  platform_.advance(3600s);
  handle(2);
  EXPECT_EQ(trail().size(), 1U);
}

TEST_F(SnareTrigger, AStreamOfEqualMessagesCountsOnce) {
  useProbes<WholeProbe>();
  handleAll({1, 1, 1, 1});
  EXPECT_EQ(state().interestedCount, 1U);
  EXPECT_EQ(trail(), (std::vector<std::string>{"WholeProbe handle 1"}));
}

TEST_F(SnareTrigger, OnlyTheLastInterestingMessageMakesARepeat) {
  probes().thresholdCount = 10;
  useProbes<WholeProbe>();
  handleAll({1, 2});
  worker_.handleMessage(message({{"other", 1}}));  // of no interest, so 2 is still the last
  handleAll({2, 1, 2});
  EXPECT_EQ(state().interestedCount, 4U);
}

TEST_F(SnareTrigger, AfterAFireTheSameMessageCountsAgain) {
  useProbes<FiringProbe>();
  handleAll({1, 2, 2, 1});
  EXPECT_EQ(trail(), (std::vector<std::string>{"FiringProbe fire 2", "FiringProbe fire 1"}));
}

TEST_F(SnareTrigger, TheLastMessageIsACopyThatNoChangeOfTheRecordReaches) {
  probes().thresholdCount = 10;
  useProbes<FiringProbe>();
  const Message record = message({{"n", 1}});
  worker_.handleMessage(record);
  EXPECT_NE(state().lastMessage, record);
  record->mutableMessage().set("isSessionStarted", "YES");
  ASSERT_TRUE(state().lastMessage != nullptr);
  EXPECT_EQ(state().lastMessage->message(), (plist::Dictionary{{"n", 1}}));
  handle(1);
  EXPECT_EQ(state().interestedCount, 1U);
}

TEST_F(SnareTrigger, TheCopySharesThePayload) {
  probes().thresholdCount = 10;
  useProbes<FiringProbe>();
  const Message record = message({{"n", 1}});
  worker_.handleMessage(record);
  ASSERT_TRUE(state().lastMessage != nullptr);
  EXPECT_TRUE(state().lastMessage->message().sharesStorageWith(record->message()));
}

TEST_F(SnareTrigger, OncePerSessionCountsOnAndNeverFiresAgain) {
  probes().once = true;
  useProbes<FiringProbe>();
  handleAll({1, 2, 3, 4, 5});
  EXPECT_EQ(trail(), (std::vector<std::string>{"FiringProbe fire 2"}));
  EXPECT_EQ(state().interestedCount, 3U);
  EXPECT_EQ(state().firedCount, 1U);
  EXPECT_TRUE(state().lastMessage != nullptr);
}

TEST_F(SnareTrigger, InASessionOfTypeTestItCountsAndFiresWithoutFiring) {
  session_->setServiceType(AudioServiceType::Test);
  useProbes<FiringProbe>();
  handleAll({1, 2});
  EXPECT_TRUE(trail().empty());
  EXPECT_EQ(state().firedCount, 1U);
  EXPECT_EQ(state().interestedCount, 0U);
  EXPECT_TRUE(state().symptomReporter != nullptr);
  EXPECT_TRUE(logged(LogLevel::Info, kWorker, "Skipping actual fire, as we are running in test mode."));
}

TEST_F(SnareTrigger, EachFireHasAReporterOfItsOwn) {
  useProbes<FiringProbe>();
  handleAll({1, 2});
  const auto first = state().symptomReporter;
  handleAll({1, 2});
  EXPECT_EQ(platform_.snare.reporters(), 2U);
  EXPECT_NE(state().symptomReporter, first);
}

TEST_F(SnareTrigger, AnInstanceThatCannotFireOnlyCounts) {
  useProbes<CountingProbe>();
  handleAll({1, 2, 3});
  EXPECT_EQ(state().interestedCount, 3U);
  EXPECT_EQ(state().firedCount, 0U);
  EXPECT_TRUE(state().lastMessage != nullptr);
}

TEST_F(SnareTrigger, InstancesAreAskedInOrderAndCountEachForItself) {
  useProbes<WholeProbe, CountingProbe, FiringProbe>();
  handleAll({1, 2});
  EXPECT_EQ(trail(), (std::vector<std::string>{"WholeProbe handle 1", "WholeProbe handle 2", "WholeProbe fire 2",
                                               "FiringProbe fire 2"}));
  EXPECT_EQ(state(1).interestedCount, 2U);
}

TEST_F(SnareTrigger, InterestIsLoggedWithTheInstanceAndTheMessage) {
  useProbes<WholeProbe>();
  handle(1);
  EXPECT_TRUE(logged(LogLevel::Debug, kWorker,
                     "Interested in message. instance=WholeProbe, category=Playback type=Start {n = 1}"));
  handle(1);
  EXPECT_EQ(platform_.log.count("Interested in message."), 1U);
}

TEST_F(SnareTrigger, WhatIsOfNoInterestChangesAndLogsNothing) {
  useProbes<WholeProbe, FiringProbe>();
  platform_.log.clear();
  worker_.handleMessage(message({{"other", 1}}));
  worker_.handleMessage(message({}));
  worker_.handleMessage(nullptr);
  EXPECT_EQ(state().interestedCount, 0U);
  EXPECT_EQ(state().lastMessage, nullptr);
  EXPECT_TRUE(trail().empty());
  EXPECT_TRUE(platform_.log.entries().empty());
}

TEST_F(SnareTrigger, StartsAndStopsThoseInstancesThatCan) {
  useProbes<WholeProbe, FiringProbe>();
  EXPECT_FALSE(worker_.started());
  EXPECT_TRUE(worker_.start());
  EXPECT_TRUE(worker_.started());
  worker_.stop();
  EXPECT_FALSE(worker_.started());
  EXPECT_EQ(trail(), (std::vector<std::string>{"WholeProbe start", "WholeProbe stop"}));
}

TEST_F(SnareTrigger, InstancesThatDeclineAreLeftOut) {
  useProbes<DecliningProbe, FiringProbe>();
  ASSERT_EQ(worker_.instances().size(), 1U);
  EXPECT_EQ(worker_.instances().front().instanceClass.name, "FiringProbe");
}

TEST_F(SnareTrigger, ASingleMessageSessionTakesOnlyInstancesThatWantIt) {
  const Session single = makeSession(1, TarnReportingSession::Mode::SingleMessage);
  Worker worker(single);
  worker.addInstance(Worker::InstanceClass::of<CountingProbe>());  // doesn't say
  worker.addInstance(Worker::InstanceClass::of<FiringProbe>());    // says no
  worker.addInstance(Worker::InstanceClass::of<WholeProbe>());     // says yes
  ASSERT_EQ(worker.instances().size(), 1U);
  EXPECT_EQ(worker.instances().front().instanceClass.name, "WholeProbe");
}

TEST_F(SnareTrigger, WithoutItsSessionItCountsNothing) {
  useProbes<WholeProbe>();
  session_.reset();
  handle(1);
  worker_.addInstance(Worker::InstanceClass::of<FiringProbe>());
  EXPECT_EQ(state().interestedCount, 0U);
  EXPECT_EQ(worker_.instances().size(), 1U);
  worker_.stop();
}

TEST_F(SnareTrigger, AnInstanceStartsAndStopsWhileTheWorkerIsStarted) {
  useProbes<WholeProbe>();
  std::vector<std::string> started;
  probes().look = [&](const std::string& verb) {
    if (worker_.started()) {
      started.push_back(verb);
    }
  };
  worker_.start();
  worker_.stop();
  EXPECT_EQ(started, (std::vector<std::string>{"start", "stop"}));
}

TEST_F(SnareTrigger, AnInstanceIsHandedAMessageThatIsCountedButNotYetTheLast) {
  useProbes<WholeProbe>();
  std::vector<std::uint64_t> counts;
  std::size_t withALast = 0;
  probes().look = [&](const std::string& verb) {
    if (verb == "handle") {
      counts.push_back(state().interestedCount);
      withALast += state().lastMessage != nullptr ? 1U : 0U;
      EXPECT_TRUE(state().interestFirstSeen.get());
    }
  };
  handle(1);
  EXPECT_EQ(withALast, 0U);
  handle(2);
  EXPECT_EQ(counts, (std::vector<std::uint64_t>{1, 2}));
  EXPECT_EQ(withALast, 1U);
}

TEST_F(SnareTrigger, AnInstanceFiresWithItsReporterAndItsCountBeforeAllIsReset) {
  useProbes<WholeProbe>();
  bool fired = false;
  probes().look = [&](const std::string& verb) {
    if (verb == "fire") {
      fired = true;
      EXPECT_TRUE(state().symptomReporter != nullptr);
      EXPECT_EQ(state().firedCount, 1U);
      EXPECT_EQ(state().interestedCount, 2U);
      ASSERT_TRUE(state().lastMessage != nullptr);
      EXPECT_EQ(state().lastMessage->message()["n"].asInt64(), 2);
    }
  };
  handleAll({1, 2});
  EXPECT_TRUE(fired);
}

TEST_F(SnareTrigger, InterestIsToldThenTheMessageCopiedThenTheReporterMade) {
  probes().thresholdCount = 1;
  useProbes<WholeProbe>();
  platform_.order.start();
  handle(1);
  EXPECT_EQ(
      platform_.order.entries(),
      (std::vector<std::string>{"log Interested in message. instance=WholeProbe, category=Playback type=Start {n = 1}",
                                "log copyWithZone", "snare reporter"}));
}

}  // namespace
}  // namespace tarn
