// SPDX-License-Identifier: Apache-2.0
#include "wire/RequestDecoder.h"

#include <array>
#include <limits>
#include <new>
#include <utility>

#include "wire/BuilderSink.h"
#include "wire/PropertyListReader.h"
#include "wire/WellFormed.h"

namespace tarn::wire {

namespace {

// One pass over a frame. It stops at the first trouble and keeps what it was; whether the frame can be answered at all
// is found out afterwards.
class RequestPass {
 public:
  RequestPass(std::span<const std::byte> frame, DecodedRequest& request, plist::PackedBuilder& builder,
              plist::KeyListCache& keyLists, KeyShapes& shapes) noexcept
      : in_(frame), request_(request), builder_(builder), keyLists_(keyLists), shapes_(shapes) {}

  bool run();
  bool hasID() const noexcept { return hasID_; }
  const char* trouble() const noexcept { return trouble_; }
  ErrorCode code() const noexcept { return code_; }
  std::string describe() const;

 private:
  bool readFrameHead();
  bool readID();
  bool readOperation();
  bool readArguments();
  // The arguments of one operation, so that each is read into its member without asking what it is.
  template <Operation kOperation>
  static bool readArgumentsOf([[maybe_unused]] RequestPass& pass);
  bool readEnd();
  // Each fails with `expected` where something of another kind stands.
  bool read(std::int64_t& number, const char* expected);
  template <class Number>
  bool read(Number& number, const char* expected);
  bool read(plist::Dictionary& dictionary, const char* expected);
  bool read(ReporterIDs& reporterIDs, const char* expected);
  // The entries at the front of a dictionary whose keys are those of a shape: their values, without the keys.
  struct Known {
    const KeyShape* shape = nullptr;
    std::size_t count = 0;
  };
  bool readKnown(PropertyListReader<BuilderSink>& reader, std::uint64_t entries, Known& known);
  bool countOpenItems();

  bool fail(ErrorCode code, const char* trouble) noexcept {
    code_ = code;
    trouble_ = trouble;
    return false;
  }
  // Drops what was made of the dictionary.
  bool notPropertyList(const char* trouble) noexcept {
    builder_.reset();
    return fail(ErrorCode::NotPropertyList, trouble);
  }
  bool badArgument(const char* trouble) noexcept { return fail(ErrorCode::BadArguments, trouble); }

  CborReader in_;
  DecodedRequest& request_;
  plist::PackedBuilder& builder_;
  plist::KeyListCache& keyLists_;
  KeyShapes& shapes_;
  std::uint64_t items_ = 0;  // of the frame's array
  bool openEnded_ = false;
  bool hasID_ = false;
  bool hasOperation_ = false;
  ErrorCode code_ = ErrorCode::BadArguments;
  const char* trouble_ = "not a CBOR array";
};

bool RequestPass::run() {
  return readFrameHead() && readID() && readOperation() && readArguments() && readEnd();
}

bool RequestPass::readFrameHead() {
  CborHead head;
  if (!in_.readHead(head) || head.major != Major::Array) return false;
  items_ = head.argument;
  openEnded_ = head.open();
  return !openEnded_ || countOpenItems();
}

// An open-ended array tells its length only at its break: a walk of its own counts, before the arguments are looked at.
// It ends early where there are more than any operation takes.
bool RequestPass::countOpenItems() {
  constexpr std::uint64_t kTooMany = 2 + kMaxArguments + 1;
  CborReader ahead = in_;
  while (!ahead.atBreak() && items_ < kTooMany) {
    if (ahead.atEnd() || skipItem(ahead) != nullptr) return false;
    ++items_;
  }
  return true;
}

bool RequestPass::readID() {
  trouble_ = "no readable id";
  CborHead head;
  if (!in_.readHead(head) || head.major != Major::Unsigned) return false;
  request_.id = head.argument;
  hasID_ = true;
  return true;
}

bool RequestPass::readOperation() {
  if (items_ < 2) return badArgument("an operation is missing");
  CborHead head;
  if (!in_.readHead(head)) return false;
  const std::optional<Operation> operation =
      head.major == Major::Unsigned ? operationFromNumber(head.argument) : std::nullopt;
  if (!operation) return fail(ErrorCode::UnknownOperation, "unknown operation");
  request_.operation = *operation;
  hasOperation_ = true;
  return items_ - 2 == rowOf(*operation).arguments.size() || badArgument("wrong number of arguments");
}

template <Operation kOperation>
bool RequestPass::readArgumentsOf([[maybe_unused]] RequestPass& pass) {
  static constexpr ArgumentList kList = rowOf(kOperation).arguments;
  return [&]<std::size_t... kIndex>(std::index_sequence<kIndex...>) {
    return (pass.read(argumentIn<kList[kIndex]>(pass.request_), rowOf(kList[kIndex]).expected) && ...);
  }
  (std::make_index_sequence<kList.size()>());
}

bool RequestPass::readArguments() {
  static constexpr auto kReaders = []<std::size_t... kIndex>(std::index_sequence<kIndex...>) {
    return std::array{&RequestPass::readArgumentsOf<kOperations[kIndex].operation>...};
  }
  (std::make_index_sequence<kOperations.size()>());
  return kReaders[operationIndex(numberOf(request_.operation))](*this);
}

bool RequestPass::readEnd() {
  if (openEnded_) {
    in_.skip(1);  // the break, which the count has seen
  }
  return in_.atEnd();
}

bool RequestPass::read(std::int64_t& number, const char* expected) {
  CborHead head;
  if (!in_.readHead(head)) return false;
  const bool integer = head.major == Major::Unsigned || head.major == Major::Negative;
  if (!integer || head.argument > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max())) {
    return badArgument(expected);
  }
  const auto magnitude = static_cast<std::int64_t>(head.argument);
  number = head.major == Major::Unsigned ? magnitude : -1 - magnitude;
  return true;
}

template <class Number>
bool RequestPass::read(Number& number, const char* expected) {
  CborHead head;
  if (!in_.readHead(head)) return false;
  if (head.major != Major::Unsigned || head.argument > std::numeric_limits<Number>::max()) return badArgument(expected);
  number = static_cast<Number>(head.argument);
  return true;
}

bool RequestPass::read(plist::Dictionary& dictionary, const char* expected) {
  CborHead head;
  if (!in_.readHead(head)) return false;
  if (head.major != Major::Map) return badArgument(expected);
  BuilderSink sink(builder_, keyLists_);
  PropertyListReader<BuilderSink> reader(in_, sink);
  builder_.begin();
  Known known;
  if (!readKnown(reader, head.argument, known)) return notPropertyList(reader.trouble());
  if (known.shape != nullptr) {
    if (known.count == head.argument) {
      dictionary = builder_.finishDictionary(known.shape->keys());
      return true;
    }
    builder_.nameValues(known.shape->keys(), known.count);
  }
  if (!reader.readEntries(head, 1, known.count)) return notPropertyList(reader.trouble());
  std::optional<plist::Dictionary> finished = builder_.finishDictionary(keyLists_);
  if (!finished) return notPropertyList("a key given twice");
  shapes_.remember(finished->keys());
  dictionary = std::move(*finished);
  return true;
}

// Up to the first key that no shape expects there. Keys of a shape are all different, so none of them needs a look.
bool RequestPass::readKnown(PropertyListReader<BuilderSink>& reader, std::uint64_t entries, Known& known) {
  while (known.count < entries) {
    const KeyShape* const shape = shapes_.next(in_, entries, known.shape, known.count);
    if (shape == nullptr) return true;
    known.shape = shape;
    for (; known.count < entries && in_.takeBytes(shape->key(known.count)); ++known.count) {
      if (!reader.readValue(nullptr, 1)) return false;
    }
  }
  return true;
}

bool RequestPass::read(ReporterIDs& reporterIDs, const char* expected) {
  CborHead head;
  if (!in_.readHead(head)) return false;
  if (head.major == Major::Simple && head.info == 22) return true;
  if (head.major != Major::Array || head.argument > in_.left()) return badArgument(expected);
  constexpr const char* kTooMany = "reporter IDs: at most 65536 expected";
  static_assert(kMaxReporterIDs == 65536);
  if (head.argument > kMaxReporterIDs) return badArgument(kTooMany);
  std::vector<std::int64_t>& ids = reporterIDs.emplace();
  ids.reserve(static_cast<std::size_t>(head.argument));
  while (head.open() ? !in_.atBreak() : ids.size() < head.argument) {
    if (ids.size() == kMaxReporterIDs) return badArgument(kTooMany);
    std::int64_t id = 0;
    if (!read(id, expected)) return false;
    ids.push_back(id);
  }
  in_.skip(head.open() ? 1 : 0);
  return true;
}

std::string RequestPass::describe() const {
  const char* trouble = trouble_ != nullptr ? trouble_ : "not well-formed";
  if (!hasOperation_) return trouble;
  std::string text(operationName(request_.operation));
  text += code_ == ErrorCode::NotPropertyList ? ": not a property list: " : ": ";
  return text += trouble;
}

// What is wrong with a frame that the pass stopped in.
DecodeVerdict judge(std::span<const std::byte> frame, const RequestPass& pass, Refusal& refusal) {
  if (const char* why = checkOneItem(frame)) {
    refusal.text = why;
    return DecodeVerdict::Unreadable;
  }
  if (!pass.hasID()) {
    refusal.text = pass.trouble();
    return DecodeVerdict::Unreadable;
  }
  refusal.code = pass.code();
  refusal.text = pass.describe();
  return DecodeVerdict::Refused;
}

}  // namespace

DecodeVerdict RequestDecoder::decode(std::span<const std::byte> frame, DecodedRequest& request, Refusal& refusal) {
  request = DecodedRequest{};
  RequestPass pass(frame, request, builder_, keyLists_, shapes_);
  try {
    if (pass.run()) [[likely]] {
      return DecodeVerdict::Ok;
    }
    return judge(frame, pass, refusal);
  } catch (const std::bad_alloc&) {
    builder_.reset();
    request.dictionary = {};
    refusal.code = ErrorCode::OutOfMemory;
    refusal.text = kOutOfMemory;  // short enough to need none
    return pass.hasID() ? DecodeVerdict::Refused : DecodeVerdict::Unreadable;
  }
}

}  // namespace tarn::wire
