// SPDX-License-Identifier: Apache-2.0
// Chooses the mutant that TARN_MUTANT names, before anything else of the program is initialised. With
// TARN_MUTANT_REACHED, writes there after each test which mutants its code came by and how long it took.
#include "tools/mutate/selector.h"

#include <gtest/gtest.h>
#include <sys/mman.h>

#include <charconv>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <memory>

namespace {
constexpr std::size_t kMostMutants = 65536;
unsigned char own[kMostMutants];
}  // namespace

extern "C" {
int tarn_mutant_chosen = 0;
unsigned char* tarn_mutant_reached = own;
}

namespace {

__attribute__((constructor(101))) void choose() {
  // A death test comes by its mutants in a child of this process, so the memory is shared with it.
  void* const shared = mmap(nullptr, kMostMutants, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
  if (shared != MAP_FAILED) {
    tarn_mutant_reached = static_cast<unsigned char*>(shared);
  }
  const char* const id = std::getenv("TARN_MUTANT");
  if (id != nullptr) {
    std::from_chars(id, id + std::strlen(id), tarn_mutant_chosen);
  }
}

class Reached final : public ::testing::EmptyTestEventListener {
 public:
  explicit Reached(const char* path) : out_(path) {}

 private:
  void OnTestStart(const ::testing::TestInfo&) override {
    // What is reached between tests, as in the initialisation of the program, counts for all of them.
    if (!started_) {
      tell("*", 0);
    }
    started_ = true;
    std::memset(tarn_mutant_reached, 0, kMostMutants);
  }
  void OnTestEnd(const ::testing::TestInfo& info) override {
    tell(std::string(info.test_suite_name()) + "." + info.name(), info.result()->elapsed_time());
  }
  void tell(const std::string& test, long long milliseconds) {
    out_ << test << ' ' << milliseconds;
    for (std::size_t id = 0; id < kMostMutants; ++id) {
      if (tarn_mutant_reached[id] != 0) {
        out_ << ' ' << id;
      }
    }
    out_ << '\n' << std::flush;
  }

  std::ofstream out_;
  bool started_ = false;
};

const bool kListening = [] {
  const char* const path = std::getenv("TARN_MUTANT_REACHED");
  if (path != nullptr) {
    ::testing::UnitTest::GetInstance()->listeners().Append(std::make_unique<Reached>(path).release());
  }
  return path != nullptr;
}();

}  // namespace
