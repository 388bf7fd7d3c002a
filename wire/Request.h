// Request: what one request asks for, as plain data. Which members count depends on the operation.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>
#include <type_traits>
#include <utility>
#include <variant>
#include <vector>

#include "plist/Dictionary.h"
#include "wire/Operation.h"

namespace tarn::wire {

using ReporterIDs = std::optional<std::vector<std::int64_t>>;  // nothing stands for null

struct Request {
  Operation operation = Operation::Status;
  std::uint16_t serviceType = 0;
  plist::Dictionary dictionary;  // the configuration or the message
  std::uint32_t category = 0;
  std::uint16_t type = 0;
  std::int64_t reporterID = 0;
  ReporterIDs reporterIDs;
};

// A request with the number under which its reply goes back.
struct DecodedRequest : Request {
  std::uint64_t id = 0;
};

struct ArgumentRow {
  // The type of the member is the argument's kind.
  using Member = std::variant<std::int64_t Request::*, std::uint16_t Request::*, std::uint32_t Request::*,
                              plist::Dictionary Request::*, ReporterIDs Request::*>;

  Argument argument;
  std::string_view name;  // as scripts write it
  const char* expected;   // what the wire answers to anything else
  Member member;
};

// One row for each Argument, in their order.
inline constexpr std::array kArguments = {
    ArgumentRow{Argument::ReporterID, "reporterID", "reporter ID: a signed 64-bit integer expected",
                &Request::reporterID},
    ArgumentRow{Argument::ServiceType, "serviceType", "type: 0 to 65535 expected", &Request::serviceType},
    ArgumentRow{Argument::Configuration, "configuration", "a dictionary expected", &Request::dictionary},
    ArgumentRow{Argument::Message, "message", "a dictionary expected", &Request::dictionary},
    ArgumentRow{Argument::Category, "category", "category: 0 to 4294967295 expected", &Request::category},
    ArgumentRow{Argument::Type, "type", "type: 0 to 65535 expected", &Request::type},
    ArgumentRow{Argument::ReporterIDs, "reporterIDs",
                "reporter IDs: an array of signed 64-bit integers or null expected", &Request::reporterIDs},
    ArgumentRow{Argument::Shape, "shape", "a dictionary expected", &Request::dictionary},
};
static_assert(std::all_of(kArguments.begin(), kArguments.end(), [](const ArgumentRow& row) {
  return &row == &kArguments[static_cast<std::size_t>(row.argument)];
}));

constexpr const ArgumentRow& rowOf(Argument argument) noexcept {
  return kArguments[static_cast<std::size_t>(argument)];
}

// The request's member for an argument that is known when it is compiled.
template <Argument kArgument>
auto& argumentIn(Request& request) noexcept {
  constexpr ArgumentRow::Member kMember = rowOf(kArgument).member;
  return request.*std::get<kMember.index()>(kMember);
}

// A request of this operation with its arguments, each of the kind that the table says.
template <Operation kOperation, class... Arguments>
Request makeRequest(Arguments... arguments) {
  constexpr ArgumentList kList = rowOf(kOperation).arguments;
  static_assert(sizeof...(Arguments) == kList.size());
  Request request;
  request.operation = kOperation;
  [&]<std::size_t... kIndex>(std::index_sequence<kIndex...>) {
    static_assert((std::is_same_v<Arguments&, decltype(argumentIn<kList[kIndex]>(request))> && ...));
    ((argumentIn<kList[kIndex]>(request) = std::move(arguments)), ...);
  }
  (std::index_sequence_for<Arguments...>());
  return request;
}

}  // namespace tarn::wire
