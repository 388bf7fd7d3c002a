// SPDX-License-Identifier: Apache-2.0
// Request: what one request asks for, as plain data. Which members count depends on the operation.
//
//   frame -> RequestDecoder -> DecodedRequest -> dispatcher -> the remote interface's operation       the service
//   makeRequest<Operation::SetServiceType>(type, reporterID) -> Encoder::request() -> frame           a client
//
// Both ways go by the tables of operations and arguments, so that neither end has a list of its own. Stateless but for
// the requests themselves, each of which is for one thread at a time.
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

// The sessions that a message is for. Nothing stands for null; it and an empty list mean every running session.
using ReporterIDs = std::optional<std::vector<std::int64_t>>;  // nothing stands for null

// Made by a decoder or by makeRequest(). A decoded one is used once: the dispatcher moves the arguments out. Members
// that the operation has no argument for stay at their defaults and mean nothing.
struct Request {
  // What is asked for; the default is one without arguments, which harms nobody.
  Operation operation = Operation::Status;
  // What the session is for: a number of AudioServiceType, or any other.
  std::uint16_t serviceType = 0;
  // Shares its block with whoever else holds it; no operation has two dictionaries, so one member serves all.
  plist::Dictionary dictionary;  // the configuration or the message
  // What a message is about, with a domain in its high half.
  std::uint32_t category = 0;
  // What happened, by its number.
  std::uint16_t type = 0;
  // Chosen by the client; 0 means none.
  std::int64_t reporterID = 0;
  // As they came: in the client's order, an ID twice where it named it twice.
  ReporterIDs reporterIDs;
};

// A request with the number under which its reply goes back. The client chose it: any unsigned number, and nobody
// checks that it is a new one, so a client that uses one twice can't tell its replies apart.
struct DecodedRequest : Request {
  // Known also of a request that is refused, so that the refusal finds its way back.
  std::uint64_t id = 0;
};

// What decoder, encoder, scripts and help texts know of an argument.
struct ArgumentRow {
  // The type of the member is the argument's kind: a visitor has one case for each, and a kind that it lacks doesn't
  // compile.
  using Member = std::variant<std::int64_t Request::*, std::uint16_t Request::*, std::uint32_t Request::*,
                              plist::Dictionary Request::*, ReporterIDs Request::*>;

  // For the check below: the row's place says the same.
  Argument argument;
  std::string_view name;  // as scripts write it
  const char* expected;   // what the wire answers to anything else
  Member member;
};

// One row for each Argument, in their order, so that an argument leads to its row without a search. What stands on the
// wire for a member, and is refused when it is anything else:
//
//   std::int64_t                    an integer of 64 bits with its sign
//   std::uint16_t, std::uint32_t    an unsigned integer within the type's range
//   plist::Dictionary               a map that is a property list
//   ReporterIDs                     an array of integers, or null
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
// Each row stands at its argument's number.
static_assert(std::all_of(kArguments.begin(), kArguments.end(), [](const ArgumentRow& row) {
  return &row == &kArguments[static_cast<std::size_t>(row.argument)];
}));

// Costs an index.
constexpr const ArgumentRow& rowOf(Argument argument) noexcept {
  return kArguments[static_cast<std::size_t>(argument)];
}

// The request's member for an argument that is known when it is compiled: a reference of the member's own type, so that
// argumentIn<Argument::Category>(request) is a std::uint32_t. The dispatcher calls the remote interface with these.
template <Argument kArgument>
auto& argumentIn(Request& request) noexcept {
  // The index of the variant tells the member's type at compile time.
  constexpr ArgumentRow::Member kMember = rowOf(kArgument).member;
  return request.*std::get<kMember.index()>(kMember);
}

// A request of this operation with its arguments, in the table's order and each exactly of the kind that the table
// says: anything else doesn't compile, so a client can't ask for what the service would refuse.
template <Operation kOperation, class... Arguments>
Request makeRequest(Arguments... arguments) {
  // The two checks make a wrong call a compiler's error: as many arguments as the row has, each of exactly its member's
  // type.
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
