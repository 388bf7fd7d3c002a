// SPDX-License-Identifier: Apache-2.0
#include "fleet/ask/Ranking.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <map>
#include <tuple>

namespace tarn::fleet {

namespace {

constexpr double kTail = 0.025;
constexpr double kQuantile = 1.959963984540054;  // of the normal distribution, at 1 - kTail
constexpr double kHour = 3600;
constexpr double kNegligible = 1e-17;

double logFactorial(std::int64_t count) {
  double sum = 0;
  for (std::int64_t i = 2; i <= count; ++i) {
    sum += std::log(static_cast<double>(i));
  }
  return sum;
}

// The probability of exactly so many.
double probability(std::int64_t count, double expected, double logOfFactorial) {
  return std::exp(static_cast<double>(count) * std::log(expected) - expected - logOfFactorial);
}

// Of so many or fewer; `expected` isn't below the count, so that each further term is less.
double atMost(std::int64_t count, double expected, double logOfFactorial) {
  double term = 1;
  double sum = 1;
  for (std::int64_t i = count; i > 0 && term > kNegligible * sum; --i) {
    term *= static_cast<double>(i) / expected;
    sum += term;
  }
  return sum * probability(count, expected, logOfFactorial);
}

// Of so many or more; `expected` isn't above the count.
double atLeast(std::int64_t count, double expected, double logOfFactorial) {
  double term = 1;
  double sum = 1;
  for (std::int64_t i = count + 1; term > kNegligible * sum; ++i) {
    term *= expected / static_cast<double>(i);
    sum += term;
  }
  return sum * probability(count, expected, logOfFactorial);
}

// Where a function that goes one way from `from` to `to` passes the tail's probability.
template <class Tail>
double whereItPasses(double from, double to, Tail tail) {
  const bool isAboveAtFirst = tail(from) > kTail;
  for (double middle = from + (to - from) / 2; middle != from && middle != to; middle = from + (to - from) / 2) {
    ((tail(middle) > kTail) == isAboveAtFirst ? from : to) = middle;
  }
  return from;
}

double cubed(double value) {
  return value * value * value;
}

double byarLow(std::int64_t count) {
  const auto k = static_cast<double>(count);
  return k * cubed(1 - 1 / (9 * k) - kQuantile / (3 * std::sqrt(k)));
}

double byarHigh(std::int64_t count) {
  const double k = static_cast<double>(count) + 1;
  return k * cubed(1 - 1 / (9 * k) + kQuantile / (3 * std::sqrt(k)));
}

double exactLow(std::int64_t count) {
  const double logOfFactorial = logFactorial(count);
  return whereItPasses(1e-9, static_cast<double>(count),
                       [&](double expected) { return atLeast(count, expected, logOfFactorial); });
}

double exactHigh(std::int64_t count) {
  const double logOfFactorial = logFactorial(count);
  const auto k = static_cast<double>(count);
  // Far enough: the tail is below a millionth there.
  return whereItPasses(std::max(k, 1e-9), k + 15 + 6 * std::sqrt(k),
                       [&](double expected) { return atMost(count, expected, logOfFactorial); });
}

double lowOf(std::int64_t count) {
  if (count <= 0) return 0;
  return count <= kMostExact ? exactLow(count) : byarLow(count);
}

double highOf(std::int64_t count) {
  return count <= kMostExact ? exactHigh(std::max<std::int64_t>(count, 0)) : byarHigh(count);
}

bool hasPlay(const Played& played) {
  return played.seconds > 0 && std::isfinite(played.seconds);
}

// A place of those with play, and the lower end of its rate.
struct Ranked {
  const Played* played = nullptr;
  double low = 0;
};

double simpleRate(const Played& played) {
  return static_cast<double>(played.overloads) / (played.seconds / kHour);
}

bool isWorse(const Ranked& a, const Ranked& b) {
  if (hasPlay(*a.played) != hasPlay(*b.played)) return hasPlay(*a.played);
  if (!hasPlay(*a.played)) {
    return std::tie(b.played->overloads, a.played->name) < std::tie(a.played->overloads, b.played->name);
  }
  const double rateOfA = simpleRate(*a.played);
  const double rateOfB = simpleRate(*b.played);
  return std::tie(b.low, rateOfB, b.played->seconds, a.played->name) <
         std::tie(a.low, rateOfA, a.played->seconds, b.played->name);
}

}  // namespace

Interval poissonInterval(std::int64_t count) {
  return {lowOf(count), highOf(count)};
}

std::optional<Rate> rateOf(const Played& played) {
  if (!hasPlay(played)) return std::nullopt;
  const Interval counts = poissonInterval(played.overloads);
  const double hours = played.seconds / kHour;
  return Rate{simpleRate(played), {counts.low / hours, counts.high / hours}};
}

std::vector<Rated> worstOf(const std::vector<Played>& all, std::size_t most) {
  std::map<std::int64_t, double> lows;  // the same few counts are most of them
  std::vector<Ranked> ranked;
  for (const Played& played : all) {
    if (!hasPlay(played)) {
      ranked.push_back({&played, 0});
      continue;
    }
    const auto [low, isNew] = lows.try_emplace(played.overloads, 0);
    if (isNew) {
      low->second = lowOf(played.overloads);
    }
    ranked.push_back({&played, low->second / (played.seconds / kHour)});
  }
  const auto shown = static_cast<std::ptrdiff_t>(std::min(most, ranked.size()));
  std::partial_sort(ranked.begin(), ranked.begin() + shown, ranked.end(), isWorse);
  std::vector<Rated> worst;
  for (std::ptrdiff_t i = 0; i < shown; ++i) {
    worst.push_back({*ranked[static_cast<std::size_t>(i)].played, rateOf(*ranked[static_cast<std::size_t>(i)].played)});
  }
  return worst;
}

std::string rateText(double rate) {
  std::array<char, 48> text{};
  std::snprintf(text.data(), text.size(), rate >= 100 ? "%.0f" : "%.3g", rate);
  return text.data();
}

}  // namespace tarn::fleet
