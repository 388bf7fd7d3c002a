// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdlib>
#include <string>
#include <vector>

namespace sums {

inline bool isSmall(int number) {
  return number < 10;
}

int larger(int a, int b);
int limited(int number);
std::vector<std::string> steps(bool skipsLast);
int nobodyCalls(int number);
void refuseNegative(int number);

}  // namespace sums
