// SPDX-License-Identifier: Apache-2.0
#include <sums/Sums.h>

#include <array>

namespace sums {

constexpr int kLimit = 5;
const int kSizeOfATable = 3;
static_assert(kLimit != 6);

int larger(int a, int b) {
  return a < b ? b : a;
}

int limited(int number) {
  const std::array<int, kSizeOfATable> table{};
  return number > kLimit ? kLimit : number + table[0];
}

std::vector<std::string> steps(bool skipsLast) {
  std::vector<std::string> made;
  made.push_back("one");
  made.push_back("two");
  if (skipsLast) {
    made.pop_back();
  }
  made.reserve(7);
  return made;
}

int nobodyCalls(int number) {
  return number * 3;
}

void refuseNegative(int number) {
  if (number < 0) {
    std::abort();
  }
}

}  // namespace sums
