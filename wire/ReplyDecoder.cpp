// SPDX-License-Identifier: Apache-2.0
#include "wire/ReplyDecoder.h"

#include <limits>
#include <utility>

#include "wire/BuilderSink.h"
#include "wire/PropertyListReader.h"

namespace tarn::wire {

namespace {

class ReplyPass {
 public:
  ReplyPass(std::span<const std::byte> frame, DecodedReply& reply, plist::PackedBuilder& builder,
            plist::KeyListCache& keyLists) noexcept
      : in_(frame),
        reply_(reply),
        builder_(builder),
        keyLists_(keyLists),
        sink_(builder, keyLists),
        reader_(in_, sink_) {}

  bool run();
  const char* trouble() const noexcept { return trouble_; }

 private:
  bool readError();
  bool readErrorText(std::string& text);
  bool readResult();
  bool readContainer(const CborHead& head, plist::Value& value);

  CborReader in_;
  DecodedReply& reply_;
  plist::PackedBuilder& builder_;
  plist::KeyListCache& keyLists_;
  BuilderSink sink_;
  PropertyListReader<BuilderSink> reader_;
  const char* trouble_ = "not a reply array";
};

bool ReplyPass::run() {
  CborHead head;
  CborHead id;
  if (!in_.readHead(head) || head.major != Major::Array || head.open() || head.argument < 2 || !in_.readHead(id) ||
      id.major != Major::Unsigned) {
    return false;
  }
  reply_.id = id.argument;
  trouble_ = "an error that is neither null nor [domain, code, text]";
  if (!readError()) return false;
  trouble_ = "a result that is no property-list value";
  for (std::uint64_t i = 2; i < head.argument; ++i) {
    if (!readResult()) return false;
  }
  trouble_ = "bytes behind the array";
  return in_.atEnd();
}

bool ReplyPass::readError() {
  CborHead head;
  if (!in_.readHead(head)) return false;
  if (head.major == Major::Simple && head.info == 22) return true;
  if (head.major != Major::Array || head.open() || head.argument != 3) return false;
  ReplyError& error = reply_.error.emplace();
  CborHead codeHead;
  plist::ValueView code;
  if (!readErrorText(error.domain) || !in_.readHead(codeHead) || !reader_.readScalar(codeHead, code) ||
      code.kind() != plist::Kind::Signed) {
    return false;
  }
  error.code = code.signedValue();
  return readErrorText(error.text);
}

bool ReplyPass::readErrorText(std::string& text) {
  CborHead head;
  plist::ValueView value;
  if (!in_.readHead(head) || !reader_.readScalar(head, value) || !value.isText()) return false;
  text = value.text();
  return true;
}

bool ReplyPass::readResult() {
  CborHead head;
  if (!in_.readHead(head)) return false;
  if (head.major == Major::Array || head.major == Major::Map) return readContainer(head, reply_.results.emplace_back());
  plist::ValueView value;
  if (!reader_.readScalar(head, value)) return false;
  reply_.results.emplace_back(value);
  return true;
}

bool ReplyPass::readContainer(const CborHead& head, plist::Value& value) {
  builder_.begin();
  if (head.major == Major::Array) {
    if (!reader_.readItems(head, 1)) return false;
    value = builder_.finishArray();
    return true;
  }
  if (!reader_.readEntries(head, 1)) return false;
  const std::optional<plist::Dictionary> dictionary = builder_.finishDictionary(keyLists_);
  if (dictionary) {
    value = *dictionary;
  }
  return dictionary.has_value();
}

}  // namespace

Status ReplyDecoder::decode(std::span<const std::byte> frame, DecodedReply& reply) {
  reply.error.reset();
  reply.results.clear();
  ReplyPass pass(frame, reply, builder_, keyLists_);
  if (pass.run()) return {};
  builder_.reset();
  return Error{0, pass.trouble()};
}

}  // namespace tarn::wire
