// SPDX-License-Identifier: Apache-2.0
// How often the service and the posting library wake up while 50 rings are open and nothing is posted.
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "bench/Measure.h"
#include "bench/Poster.h"
#include "bench/Processes.h"
#include "bench/figures/Figures.h"

namespace tarn::bench {

namespace {

constexpr int kClients = 2;
constexpr int kWritersAClient = 25;
constexpr std::uint32_t kSmallRing = 4096;
constexpr useconds_t kUntilQuietMicroseconds = 3'000'000;  // rings fall asleep after a second
constexpr useconds_t kWatchedMicroseconds = 5'000'000;

// How often the threads of a process went to sleep so far, but for that one.
double sleeps(pid_t process, pid_t butThread = 0) {
  double total = 0;
  for (const auto& task : std::filesystem::directory_iterator("/proc/" + std::to_string(process) + "/task")) {
    if (task.path().filename() == std::to_string(butThread)) continue;
    std::ifstream status(task.path() / "status");
    std::string word;
    double count = 0;
    while (status >> word) {
      if (word == "voluntary_ctxt_switches:" && status >> count) {
        total += count;
      }
    }
  }
  return total;
}

// Wake-ups a second of the service and of this process's other threads.
std::vector<double> watch(const Settings& settings, pid_t service) {
  ::usleep(kUntilQuietMicroseconds);
  const double services = sleeps(service);
  const double own = sleeps(::getpid(), ::gettid());
  const double start = nowSeconds();
  ::usleep(settings.quick ? kWatchedMicroseconds / 5 : kWatchedMicroseconds);
  const double seconds = nowSeconds() - start;
  return {(sleeps(service) - services) / seconds, (sleeps(::getpid(), ::gettid()) - own) / seconds};
}

}  // namespace

void measureIdle(const Settings& settings, Table& table) {
  const ServiceProcess service(settings, {});
  const double without = measureInChild([&] { return watch(settings, service.id()); })[0];
  const std::vector<double> with = measureInChild([&] {
    std::vector<std::unique_ptr<Poster>> posters;
    for (int client = 0; client < kClients; ++client) {
      posters.push_back(std::make_unique<Poster>(service.socketPath()));
      for (int writer = 1; writer < kWritersAClient; ++writer) {
        posters.back()->openWriter(kSmallRing);
      }
      posters.back()->post(0);
      posters.back()->waitUntilTaken();
    }
    return watch(settings, service.id());
  });
  table.addWithTarget({"wake-ups a second with 50 quiet rings, service",
                       aSecond(with[0]),
                       "without rings " + aSecond(without),
                       {},
                       "<= 0",
                       {}},
                      with[0], 0);
  table.addWithTarget({"wake-ups a second with 50 quiet rings, library", aSecond(with[1]), {}, {}, "<= 0", {}}, with[1],
                      0);
}

}  // namespace tarn::bench
