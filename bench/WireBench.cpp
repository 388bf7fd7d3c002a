// What it costs to decode and check one message of 12 keys (305 bytes of CBOR), and to encode it, beside peers that are
// measured in the same run: a bare walk over the bytes, nlohmann::json and, where it is installed, libcbor.
#include <benchmark/benchmark.h>

#include <cstdint>
#include <nlohmann/json.hpp>
#include <span>
#include <string>
#include <vector>

#include "bench/Message.h"
#include "bench/ViewSink.h"
#include "wire/Encoder.h"
#include "wire/RequestDecoder.h"
#ifdef TARN_HAVE_LIBCBOR
#include <cbor.h>
#endif

namespace {

using namespace tarn;

std::span<const std::byte> asBytes(const std::string& text) {
  return std::as_bytes(std::span(text));
}

void decodeToViews(benchmark::State& state) {
  const std::string bytes = bench::makeCbor(1);
  bench::ViewSink sink;
  for (auto _ : state) {
    if (!sink.read(asBytes(bytes), bench::kMessageKeys)) state.SkipWithError("refused");
    benchmark::DoNotOptimize(sink.values().data());
    benchmark::ClobberMemory();
  }
  state.counters["bytes"] = static_cast<double>(bytes.size());
}
BENCHMARK(decodeToViews);

// A whole frame: request head, dictionary, arguments.
void decodeToRequest(benchmark::State& state) {
  const std::string frame = bench::makeFrame(1);
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
  const plist::Dictionary message = bench::makeMessage(1);
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
  const std::string bytes = bench::makeCbor(1);
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
  const std::string bytes = bench::makeCbor(1);
  for (auto _ : state) {
    nlohmann::json value = nlohmann::json::from_cbor(bytes);
    benchmark::DoNotOptimize(value);
  }
}
BENCHMARK(peerNlohmann);

#ifdef TARN_HAVE_LIBCBOR
void peerLibcbor(benchmark::State& state) {
  const std::string bytes = bench::makeCbor(1);
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
