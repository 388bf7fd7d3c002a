// SPDX-License-Identifier: Apache-2.0
// How soon a message that was sent is seen by whoever follows the store, and how soon it is known to be on the disk.
#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <cstdlib>
#include <filesystem>
#include <string_view>

#include "bench/Measure.h"
#include "bench/Message.h"
#include "bench/ServiceReceiver.h"
#include "bench/figures/Figures.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kMessages = 15'000;  // three seconds of them
constexpr double kMessagesASecond = 5'000;
constexpr std::size_t kSettleEach = 100;
constexpr double kPatienceSeconds = 20;
constexpr double kVisibleTarget = 10e-3;
constexpr double kDurableTarget = 25e-3;

// A reader of `tarnreportingctl events --follow --json` on the service's state directory.
class Follower {
 public:
  Follower(const Settings& settings, const ServiceReceiver& service)
      : ends_(), child_([this, &settings, &service] {
          ::dup2(ends_.theirs, STDOUT_FILENO);
          const std::string program =
              std::filesystem::path(settings.serviceFile).replace_filename("tarnreportingctl").string();
          const std::string state = service.stateDirectory();
          ::execl(program.c_str(), program.c_str(), "--state-dir", state.c_str(), "events", "--follow", "--json",
                  nullptr);
        }) {
    ::close(ends_.theirs);
    ::fcntl(ends_.ours, F_SETFL, O_NONBLOCK);
  }
  ~Follower() { ::close(ends_.ours); }
  Follower(const Follower&) = delete;
  Follower& operator=(const Follower&) = delete;

  int fd() const noexcept { return ends_.ours; }
  // Calls with the number of the message of each event that was printed.
  template <class Call>
  void read(const Call& call) {
    char part[65'536];
    for (ssize_t size = 0; (size = ::read(ends_.ours, part, sizeof part)) > 0;) {
      text_.append(part, static_cast<std::size_t>(size));
    }
    std::size_t begin = 0;
    for (std::size_t end = 0; (end = text_.find('\n', begin)) != std::string::npos; begin = end + 1) {
      call(numberOf(std::string_view(text_).substr(begin, end - begin)));
    }
    text_.erase(0, begin);
  }

 private:
  // 0 when it is the event of something else.
  static std::uint64_t numberOf(std::string_view line) {
    constexpr std::string_view kMember = "\"underrun_count\":";
    const std::size_t at = line.find(kMember);
    std::uint64_t count = kFirstCount;
    if (at != std::string_view::npos) {
      std::from_chars(line.data() + at + kMember.size(), line.data() + line.size(), count);
    }
    return count - kFirstCount;
  }

  SocketPair ends_;
  ChildProcess child_;
  std::string text_;
};

class Visibility {
 public:
  explicit Visibility(const Settings& settings)
      : service_(settings, {.recordsEvents = true}, Writes::OneEach), follower_(settings, service_) {
    stream(settings.count(kMessages) / 5 + 1, false);  // not counted
    seen_.clear();
  }

  // Sends at the rate, with a question for its safety after every hundredth message or without, until all is seen.
  void stream(std::size_t count, bool settling) {
    const double start = nowSeconds();
    const std::size_t first = sent_.size();
    const std::size_t goal = eventsSeen_ + 2 * count;
    for (std::size_t i = 0; i < count; ++i) {
      takeUntil(start + static_cast<double>(i) / kMessagesASecond);
      sent_.push_back(nowSeconds());
      const std::uint64_t number = service_.send();
      if (number != first + i + 1) {
        fail("the numbers of the messages aren't those expected");
      }
      if (settling && i % kSettleEach == 0) {
        service_.client().send(client::settle(), [this, sent = sent_.back()](client::Reply&& reply) {
          if (reply.ok()) {
            settled_.push_back(nowSeconds() - sent);
          }
        });
      }
    }
    const double latest = nowSeconds() + kPatienceSeconds;
    while (eventsSeen_ < goal || service_.client().outstanding() > 1) {  // a start is answered at the stop
      if (nowSeconds() > latest) {
        fail("of " + std::to_string(goal) + " events " + std::to_string(eventsSeen_) + " were seen, and " +
             std::to_string(service_.client().outstanding()) + " replies are outstanding");
      }
      takeUntil(nowSeconds() + 1e-3);
    }
    service_.forget();
  }

  Samples& seen() { return seen_; }
  Samples& settled() { return settled_; }

 private:
  // Takes what comes until then.
  void takeUntil(double due) {
    do {
      const double left = std::max(0.0, due - nowSeconds());
      const timespec timeout{0, static_cast<long>(left * 1e9)};
      pollfd polled[] = {{follower_.fd(), POLLIN, 0}, {service_.client().fd(), POLLIN, 0}};
      ::ppoll(polled, 2, &timeout, nullptr);
      service_.client().dispatch();
      follower_.read([this](std::uint64_t number) {
        if (number == 0 || number > sent_.size()) return;
        ++eventsSeen_;
        seen_.push_back(nowSeconds() - sent_[number - 1]);
      });
    } while (nowSeconds() < due);
  }

  ServiceReceiver service_;
  Follower follower_;
  Samples sent_;  // when, by number
  Samples seen_;
  Samples settled_;
  std::size_t eventsSeen_ = 0;
};

}  // namespace

void measureVisible(const Settings& settings, Table& table) {
  Visibility visibility(settings);
  Samples middles;
  Samples tails;
  Samples settled;
  for (int round = 0; round < settings.rounds; ++round) {
    visibility.seen().clear();
    visibility.stream(settings.count(kMessages), false);
    middles.push_back(percentile(visibility.seen(), 0.5));
    tails.push_back(percentile(visibility.seen(), 0.99));
    visibility.settled().clear();
    visibility.stream(settings.count(kMessages), true);
    settled.push_back(percentile(visibility.settled(), 0.99));
  }
  table.add({"followed at 5000 messages a second, median", milliseconds(median(middles)), {}, {}, "", {}});
  table.addWithTarget({"followed at 5000 messages a second, p99", milliseconds(median(tails)), {}, {}, "<= 10 ms", {}},
                      median(tails), kVisibleTarget);
  table.addWithTarget({"settled at 5000 messages a second, p99", milliseconds(median(settled)), {}, {}, "<= 25 ms", {}},
                      median(settled), kDurableTarget);
}

}  // namespace tarn::bench
