// SPDX-License-Identifier: Apache-2.0
// Ranking: whose overloads come most often, as far as so much play tells. Stateless. Threads: any.
//
// Overloads are taken to come one by one at a constant rate, so their count is Poisson's for the hours played, and two
// seconds of play with one overload say little: the true rate may be anything from a hundredth of it on. So rows are
// ranked by the lower end of the rate's 95% interval.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace tarn::fleet {

struct Interval {
  double low = 0;
  double high = 0;
};

// The 95% interval of a Poisson count's expectation, each tail at most 2.5%. Up to kMostExact it is the exact one
// (F. Garwood, Fiducial limits for the Poisson distribution, Biometrika 28, 1936): the quantiles chi2(0.025; 2k) / 2
// and chi2(0.975; 2k + 2) / 2, found by the sums of probabilities that they stand for. Beyond it is Byar's
// approximation of the same (N. Breslow and N. Day, Statistical methods in cancer research II, 1987, formula 2.11),
// which is off by less than a hundred-thousandth there.
Interval poissonInterval(std::int64_t count);
inline constexpr std::int64_t kMostExact = 1000;

// What was played by one route, release or application.
struct Played {
  std::string name;  // anybody's
  std::int64_t segments = 0;
  double seconds = 0;
  std::int64_t overloads = 0;
};

// Overloads an hour of play.
struct Rate {
  double value = 0;
  Interval between;
};

struct Rated {
  Played played;
  std::optional<Rate> rate;  // nothing without play
};

// Nothing where nothing was played.
std::optional<Rate> rateOf(const Played& played);
// The worst first, at most so many. Those without play come last: what they say is not comparable.
std::vector<Rated> worstOf(const std::vector<Played>& all, std::size_t most);
// Three digits of a rate, and no less than it is worth: 1234, 12.3, 0.0253.
std::string rateText(double rate);

}  // namespace tarn::fleet
