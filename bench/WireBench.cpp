// What it costs to decode and check one message of 12 keys (305 bytes of CBOR), and to encode it, beside peers that are
// measured in the same run: a bare walk over the bytes, nlohmann::json and, where it is installed, libcbor.
#include <benchmark/benchmark.h>

#include <cstdint>
#include <nlohmann/json.hpp>
#include <span>
#include <string>
#include <vector>

#include "plist/PackedBuilder.h"
#include "wire/Encoder.h"
#include "wire/PropertyListReader.h"
#include "wire/RequestDecoder.h"
#ifdef TARN_HAVE_LIBCBOR
#include <cbor.h>
#endif

namespace {

using namespace tarn;

// `timestamp` is a date, or a plain double for the peer that knows no tags.
plist::Dictionary makeMessage(const plist::ValueView& timestamp = plist::Date{1763632800.25}) {
  return {{"reporting_timestamp", timestamp}, {"client_application", "sys.oxbow.music.player"},
          {"audio_route", "BuiltInSpeaker"},  {"stream_sample_rate_hz", 48000.0},
          {"buffer_frame_count", 512},        {"channel_count", 2},
          {"voice_processing", false},        {"volume_scalar_value", 0.4375},
          {"duration_playing_sec", 127.53},   {"underrun_count", 3},
          {"codec_name", "lossless"},         {"session_token", "9f2c1d7e"}};
}

std::string messageBytes(const plist::Dictionary& message = makeMessage()) {
  std::string bytes;
  wire::appendValue(bytes, message);
  return bytes;
}

std::span<const std::byte> asBytes(const std::string& text) {
  return std::as_bytes(std::span(text));
}

// Collects views and refuses repeated keys, as the service's own sink does; it only makes no dictionary.
class ViewSink {
 public:
  explicit ViewSink(plist::KeyListCache& keyLists) : keyLists_(keyLists), keys_(kMost), values_(kMost) {}
  void begin() {}
  void add(std::string_view key, const plist::ValueView& value) {
    if (count_ == kMost) return;
    keys_[count_] = key;
    values_[count_] = value;
    ++count_;
    hash_ = plist::KeyList::combineHash(hash_, plist::Key::hashOf(key));
  }
  void add(const plist::ValueView&) {}
  bool endDictionary(const std::string_view*) { return true; }
  bool endArray(const std::string_view*) { return true; }
  // Whether it took everything, each key once.
  bool finish(std::size_t expected) {
    const bool whole = count_ == expected && keyLists_.find(hash_, std::span(keys_).first(count_)).has_value();
    benchmark::DoNotOptimize(values_.data());
    benchmark::ClobberMemory();
    count_ = 0;
    hash_ = 0;
    return whole;
  }

 private:
  static constexpr std::size_t kMost = 64;
  plist::KeyListCache& keyLists_;
  std::vector<std::string_view> keys_;
  std::vector<plist::ValueView> values_;
  std::size_t count_ = 0;
  std::uint64_t hash_ = 0;
};

void decodeToViews(benchmark::State& state) {
  const std::string bytes = messageBytes();
  plist::KeyListCache keyLists;
  ViewSink sink(keyLists);
  for (auto _ : state) {
    wire::CborReader in(asBytes(bytes));
    wire::PropertyListReader<ViewSink> reader(in, sink);
    wire::CborHead head;
    if (!in.readHead(head) || !reader.readEntries(head, 1) || !sink.finish(12)) state.SkipWithError("refused");
  }
  state.counters["bytes"] = static_cast<double>(bytes.size());
}
BENCHMARK(decodeToViews);

// A whole frame: request head, dictionary, arguments.
void decodeToRequest(benchmark::State& state) {
  wire::Request request;
  request.operation = wire::Operation::SendMessage;
  request.dictionary = makeMessage();
  request.category = 4;
  request.type = 1;
  request.reporterIDs = std::vector<std::int64_t>{4711};
  std::string frame;
  wire::Encoder(frame).request(123456, request);
  const auto bytes = asBytes(frame).subspan(wire::kFrameHeaderBytes);
  wire::RequestDecoder decoder;
  wire::DecodedRequest decoded;
  wire::Refusal refusal;
  for (auto _ : state) {
    if (decoder.decode(bytes, decoded, refusal) != wire::DecodeOutcome::Ok) state.SkipWithError("refused");
    benchmark::DoNotOptimize(decoded);
  }
  state.counters["bytes"] = static_cast<double>(bytes.size());
}
BENCHMARK(decodeToRequest);

void encodeMessage(benchmark::State& state) {
  const plist::Dictionary message = makeMessage();
  std::string out;
  for (auto _ : state) {
    out.clear();
    wire::appendValue(out, message);
    benchmark::DoNotOptimize(out.data());
  }
}
BENCHMARK(encodeMessage);

// The least that any decoder does: every head read, every text skipped, nothing checked or kept.
void peerBareWalk(benchmark::State& state) {
  const std::string bytes = messageBytes();
  for (auto _ : state) {
    wire::CborReader in(asBytes(bytes));
    wire::CborHead head;
    std::string_view text;
    std::uint64_t sum = 0;
    while (in.readHead(head)) {
      sum += head.argument;
      if (head.major == wire::Major::Text) in.readBytes(head.argument, text);
    }
    benchmark::DoNotOptimize(sum);
  }
}
BENCHMARK(peerBareWalk);

void peerNlohmann(benchmark::State& state) {
  const std::string bytes = messageBytes(makeMessage(1763632800.25));
  for (auto _ : state) {
    nlohmann::json value = nlohmann::json::from_cbor(bytes, true, true, nlohmann::json::cbor_tag_handler_t::ignore);
    benchmark::DoNotOptimize(value);
  }
}
BENCHMARK(peerNlohmann);

#ifdef TARN_HAVE_LIBCBOR
void peerLibcbor(benchmark::State& state) {
  const std::string bytes = messageBytes();
  for (auto _ : state) {
    cbor_load_result result;
    cbor_item_t* item = cbor_load(reinterpret_cast<cbor_data>(bytes.data()), bytes.size(), &result);
    if (item == nullptr) {
      state.SkipWithError("refused");
      break;
    }
    benchmark::DoNotOptimize(item);
    cbor_decref(&item);
  }
}
BENCHMARK(peerLibcbor);
#endif

}  // namespace

BENCHMARK_MAIN();
