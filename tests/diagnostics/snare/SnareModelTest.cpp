// SPDX-License-Identifier: Apache-2.0
// Random streams of messages over random sessions and clocks, through the Snare worker and through a slow and obvious
// model of what it must ask the capture service for.
#include <map>
#include <random>
#include <tuple>

#include "tests/diagnostics/snare/SnareFixture.h"
#include "tests/support/Seeds.h"

namespace tarn {
namespace {

using namespace testing;

// What a message is drawn from; two messages say the same exactly when they were drawn alike.
struct Drawn {
  int fault = 0;  // 0 haptics, 1 system sound, 2 alarm, 3 alarm of another kind, 4 haptics of another type, 5 nothing
  int n = 0;
  int stamp = 0;
  int category = 4;
  bool operator==(const Drawn&) const = default;
};

// One detector's memory.
struct ModelState {
  long count = 0;
  long fired = 0;
  std::vector<Drawn> last;  // none or one
  std::string capture;
  std::size_t reporter = 0;
};

struct ModelSession {
  int serviceType = 0;
  bool single = false;
  bool runs = false;
  ModelState alarm;
};

// All of it: what was asked for is kept as lines of text.
class Model {
 public:
  std::vector<std::string> lines;
  ModelState haptics;
  ModelState sounds;
  std::vector<double> lastSoundFire;  // none or one
  bool accepts = true;
  int refusal = -1;  // a reason code, or none

  void message(ModelSession& session, const Drawn& drawn, double now) {
    if (!session.runs) return;
    if (drawn.fault == 0 && counts(haptics, drawn, 2)) {
      if (fires(haptics, session)) {
        ask(haptics, "requestSnapshot", "haptics", drawn, 0);
      }
    }
    if (drawn.fault == 2 && !session.single && (session.serviceType == 4 || session.serviceType == 11) &&
        counts(session.alarm, drawn, 3) && session.alarm.fired == 0) {
      if (fires(session.alarm, session)) {
        ask(session.alarm, "startSession", "alarms", drawn, 60);
      }
    }
    if (drawn.fault == 1 && counts(sounds, drawn, 1)) {
      const bool fire = fires(sounds, session);
      if (fire && (lastSoundFire.empty() || now - lastSoundFire[0] >= 15)) {
        lastSoundFire = {now};
        ask(sounds, "requestSnapshot", "systemsounds", drawn, 0);
      }
    }
  }

  void stop(ModelSession& session) {
    if (session.runs && !session.single && !session.alarm.capture.empty()) {
      lines.push_back(std::to_string(session.alarm.reporter) + " cancelSession " + session.alarm.capture);
    }
    session.runs = false;
  }

 private:
  // Whether the message was counted and enough were.
  static bool counts(ModelState& state, const Drawn& drawn, long threshold) {
    if (!state.last.empty() && state.last[0] == drawn) return false;
    state.last = {drawn};
    ++state.count;
    return state.count >= threshold;
  }
  // Whether a fire is more than counted.
  bool fires(ModelState& state, const ModelSession& session) {
    state.reporter = ++reporters_;
    ++state.fired;
    state.count = 0;
    state.last.clear();
    return session.serviceType != 11;
  }
  void ask(ModelState& state, const std::string& what, const std::string& type, const Drawn& drawn, int seconds) {
    static const std::map<int, std::string> kCategories{{4, "Playback"}, {5, "Output"}, {11, "Error"}};
    lines.push_back(std::to_string(state.reporter) + " " + what + " " + type + " " + kCategories.at(drawn.category) +
                    " " + std::to_string(seconds));
    if (accepts) {
      state.capture = refusal < 0 ? "capture-" + std::to_string(++captures_) : "NONE_RETURNED";
    }
  }

  std::size_t reporters_ = 0;
  int captures_ = 0;
};

std::string lineOf(const FakeSnareService::Call& call) {
  const std::string reporter = std::to_string(call.reporter);
  if (call.kind == FakeSnareService::Kind::CancelSession) {
    return reporter + " cancelSession " + call.cancelledIdentifier;
  }
  const plist::Dictionary& signature = call.request.signature;
  return reporter + (call.kind == FakeSnareService::Kind::StartSession ? " startSession " : " requestSnapshot ") +
         signature["type"].asText() + " " + signature["subType"].asText() + " " +
         std::to_string(static_cast<int>(call.request.durationSeconds));
}

// One round of a test, in a world of its own.
class SnareModel : public SnareFixture {
 public:
  explicit SnareModel(std::uint64_t seed) : random_(seed) { platform_.log.setThreshold(LogLevel::Error); }
  void TestBody() override {}

  void asksForWhatTheModelAsksFor();
  void firesByTheRuleWhateverTheThresholds();

 private:
  int below(int bound) { return static_cast<int>(random_() % static_cast<unsigned>(bound)); }
  bool chance(int percent) { return below(100) < percent; }

  Drawn draw() {
    static constexpr int kCategories[]{4, 5, 11};
    Drawn drawn{below(6), below(3), below(2), kCategories[below(3)]};
    if (drawn.fault == 2 || drawn.fault == 3) {
      drawn.category = 11;
    }
    return drawn;
  }
  Message made(const Drawn& drawn) const {
    static const char* const kKeys[]{"Haptic_Active_Hardware_Time_Seconds",
                                     "System_Sound_Stuck_Time_Seconds",
                                     "issue_type",
                                     "issue_type",
                                     "Haptic_Active_Hardware_Time_Seconds",
                                     "other"};
    plist::Dictionary payload{{"n", drawn.n}, {"tarnreporting_timestamp", start_ + drawn.stamp}};
    payload.set(kKeys[drawn.fault], drawn.fault == 2 ? "LowRMS" : "1");
    const bool issue = drawn.fault == 2 || drawn.fault == 3 || drawn.fault == 4;
    return message(payload, static_cast<AudioEventCategory>(drawn.category),
                   issue ? AudioEventType::IssueDetector : AudioEventType::Wattlog);
  }
  void moveTheClock() {
    static constexpr double kSteps[]{0, 0.5, 4.999, 5, 14.999, 15, 15.001, 100, -3, -20};
    platform_.clock.setEpochSeconds(now() + kSteps[below(10)]);
  }

  std::mt19937 random_;
  const double start_ = now();
};

// One world: a few sessions of every kind that come, run, stop and go.
class SnareWorld {
 public:
  struct Pair {
    std::shared_ptr<TarnReportingSession> real;
    ModelSession model;
  };
  Model model;
  std::vector<Pair> pairs;
};

void SnareModel::asksForWhatTheModelAsksFor() {
  static constexpr std::uint16_t kTypes[]{3, 4, 4, 4, 11, 13};
  SnareWorld world;
  for (int step = 0; step < 60'000; ++step) {
    if (world.pairs.size() < 4 || (chance(1) && world.pairs.size() < 8)) {
      const bool single = chance(20);
      const std::uint16_t type = kTypes[below(6)];
      SnareWorld::Pair pair{makeSession(step + 2, single ? TarnReportingSession::Mode::SingleMessage
                                                         : TarnReportingSession::Mode::Ordinary),
                            {type, single, false, {}}};
      pair.real->setServiceType(static_cast<AudioServiceType>(type));
      world.pairs.push_back(std::move(pair));
    }
    if (chance(10)) {
      moveTheClock();
    }
    if (chance(1)) {
      platform_.snare.setAccepts(world.model.accepts = chance(80));
    }
    if (chance(1)) {
      world.model.refusal = chance(30) ? below(10) : -1;
      platform_.snare.refuseWith(world.model.refusal < 0 ? std::nullopt
                                                         : std::optional(platform::SnareReason{world.model.refusal}));
    }
    const auto place = static_cast<std::size_t>(below(static_cast<int>(world.pairs.size())));
    SnareWorld::Pair& pair = world.pairs[place];
    switch (below(30)) {
      case 0:
      case 1:
        pair.real->start();
        pair.model.runs = true;
        break;
      case 2:
        pair.real->stop();
        world.model.stop(pair.model);
        break;
      case 3:
        if (chance(20)) {
          world.pairs.erase(world.pairs.begin() + static_cast<std::ptrdiff_t>(place));
        }
        break;
      default: {
        const Drawn drawn = draw();
        world.model.message(pair.model, drawn, now());
        pair.real->sendMessage(made(drawn));
      }
    }
  }
  std::vector<std::string> real;
  for (const auto& call : calls()) {
    real.push_back(lineOf(call));
  }
  EXPECT_GT(real.size(), 1000U);
  ASSERT_EQ(real, world.model.lines);
  const Session session = startedSession(AudioServiceType::Generic);
  EXPECT_EQ(stateOf(session, kHapticLeaks).firedCount, static_cast<std::uint64_t>(world.model.haptics.fired));
  EXPECT_EQ(stateOf(session, kHapticLeaks).interestedCount, static_cast<std::uint64_t>(world.model.haptics.count));
  EXPECT_EQ(stateOf(session, kSSSLeaks).firedCount, static_cast<std::uint64_t>(world.model.sounds.fired));
}

// The rule itself, by thresholds that none of the real detectors has.
struct Rule {
  std::uint64_t thresholdCount = 0;
  double thresholdSeconds = 0;
  bool once = false;
};
Rule& ruleOfNext() {
  static Rule rule;
  return rule;
}
std::vector<int>& firedOf() {
  static std::vector<int> numbers;
  return numbers;
}

class RuledInstance : public TarnReportingSnareWorkerInstance {
 public:
  static constexpr std::string_view kClassName = "RuledInstance";
  using TarnReportingSnareWorkerInstance::TarnReportingSnareWorkerInstance;
  static std::unique_ptr<RuledInstance> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    auto state = std::make_shared<WorkerInstanceState>();
    state->interestThresholdCount = ruleOfNext().thresholdCount;
    state->interestThresholdDurationSeconds = ruleOfNext().thresholdSeconds;
    state->oncePerSession = ruleOfNext().once;
    return std::make_unique<RuledInstance>(session, std::move(state));
  }
  bool interestedInMessage(const TarnReportingSessionMessage& message) const override {
    return message.message().contains("wanted");
  }
  void fire(const TarnReportingSessionMessage& message) {
    firedOf().push_back(static_cast<int>(message.message()["step"].asInt64()));
  }
};

// The whole history since the last fire, looked through again for each message.
class RuleModel {
 public:
  explicit RuleModel(Rule rule) : rule_(rule) {}

  bool fires(int wanted, double now) {
    if (!seen_.empty() && seen_.back().first == wanted) return false;
    seen_.emplace_back(wanted, now);
    if (seen_.size() < rule_.thresholdCount) return false;
    if (rule_.thresholdCount == 0 && now - seen_.front().second <= rule_.thresholdSeconds) return false;
    if (rule_.once && firedBefore_) return false;
    firedBefore_ = true;
    seen_.clear();
    return true;
  }

 private:
  const Rule rule_;
  std::vector<std::pair<int, double>> seen_;
  bool firedBefore_ = false;
};

void SnareModel::firesByTheRuleWhateverTheThresholds() {
  const Session session = makeSession();
  std::size_t fired = 0;
  for (int round = 0; round < 300; ++round) {
    static constexpr double kSeconds[]{0, 1, 10, 60, -1};
    ruleOfNext() = {static_cast<std::uint64_t>(below(5)), kSeconds[below(5)], chance(25)};
    if (chance(5)) {
      ruleOfNext().thresholdCount = 18446744073709551615U;
    }
    firedOf().clear();
    Worker worker(session);
    worker.addInstance(Worker::InstanceClass::of<RuledInstance>());
    RuleModel model(ruleOfNext());
    std::vector<int> expected;
    for (int step = 0; step < 200; ++step) {
      if (chance(50)) {
        moveTheClock();
      }
      const int wanted = below(3);
      const double stamp = now();
      if (chance(30)) {
        worker.handleMessage(message({{"unwanted", wanted}}));
        continue;
      }
      // A repeat must be equal as a whole, so "step" is left out of the payload that is compared by most of them.
      const int number = chance(70) ? -1 : step;
      const int identity = number < 0 ? wanted : 1000 + step;
      if (model.fires(identity, stamp)) {
        expected.push_back(number);
      }
      worker.handleMessage(message({{"wanted", wanted}, {"step", number}}));
    }
    ASSERT_EQ(firedOf(), expected) << "threshold " << ruleOfNext().thresholdCount << ", "
                                   << ruleOfNext().thresholdSeconds << " s, once " << ruleOfNext().once;
    fired += expected.size();
  }
  EXPECT_GT(fired, 1000U);
}

TEST(SnareModel, AsksForWhatTheModelAsksFor) {
  for (const std::uint64_t seed : testSeeds(1)) {
    SCOPED_TRACE(seedNote(seed));
    SnareModel(seed).asksForWhatTheModelAsksFor();
  }
}

TEST(SnareModel, FiresByTheRuleWhateverTheThresholds) {
  for (const std::uint64_t seed : testSeeds(2)) {
    SCOPED_TRACE(seedNote(seed));
    SnareModel(seed).firesByTheRuleWhateverTheThresholds();
  }
}

}  // namespace
}  // namespace tarn
