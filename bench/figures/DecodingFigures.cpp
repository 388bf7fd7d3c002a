// SPDX-License-Identifier: Apache-2.0
// What it costs to decode and check one message, beside a walk that only reads heads and lengths, and beside two
// libraries; and to encode it.
#include <nlohmann/json.hpp>
#include <span>
#ifdef TARN_HAVE_LIBCBOR
#include <cbor.h>
#endif

#include "bench/Measure.h"
#include "bench/Message.h"
#include "bench/ViewSink.h"
#include "bench/figures/Figures.h"
#include "wire/Encoder.h"
#include "wire/RequestDecoder.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kDecodes = 50'000;
constexpr double kViewsTarget = 300;
constexpr double kDictionaryTarget = 600;

std::span<const std::byte> asBytes(const std::string& text) {
  return std::as_bytes(std::span(text));
}

void mustHold(bool decoded) {
  if (!decoded) {
    fail("a decoder refused the message");
  }
}

double toViews(std::size_t count, const std::string& message) {
  ViewSink sink;
  return nanosecondsEach(count, [&](std::size_t) {
    mustHold(sink.read(asBytes(message), kMessageKeys));
    keep(sink.values().data());
  });
}

// As the service does it: the whole frame, call and arguments too.
double toRequest(std::size_t count, const std::string& frame) {
  wire::RequestDecoder decoder;
  wire::DecodedRequest request;
  wire::Refusal refusal;
  const auto bytes = asBytes(frame).subspan(wire::kFrameHeaderBytes);
  return nanosecondsEach(count, [&](std::size_t) {
    mustHold(decoder.decode(bytes, request, refusal) == wire::DecodeVerdict::Ok);
    keep(&request);
  });
}

double encoded(std::size_t count, const plist::Dictionary& message) {
  std::string out;
  return nanosecondsEach(count, [&](std::size_t) {
    out.clear();
    wire::appendValue(out, message);
    keep(out.data());
  });
}

double bareWalk(std::size_t count, const std::string& message) {
  return nanosecondsEach(count, [&](std::size_t) {
    wire::CborReader in(asBytes(message));
    wire::CborHead head;
    std::string_view text;
    std::uint64_t sum = 0;
    while (in.readHead(head)) {
      sum += head.argument;
      if (head.major == wire::Major::Text) {
        in.readBytes(head.argument, text);
      }
    }
    keep(sum);
  });
}

double nlohmannJson(std::size_t count, const std::string& message) {
  return nanosecondsEach(count, [&](std::size_t) {
    const nlohmann::json value = nlohmann::json::from_cbor(message, true, false);
    mustHold(value.size() == kMessageKeys);
    keep(&value);
  });
}

#ifdef TARN_HAVE_LIBCBOR
double libcbor(std::size_t count, const std::string& message) {
  return nanosecondsEach(count, [&](std::size_t) {
    cbor_load_result result;
    cbor_item_t* item = cbor_load(reinterpret_cast<cbor_data>(message.data()), message.size(), &result);
    mustHold(item != nullptr && cbor_map_size(item) == kMessageKeys);
    keep(item);
    cbor_decref(&item);
  });
}
#endif

struct Peer {
  std::string name;
  double (*measure)(std::size_t count, const std::string& message);
  Samples samples{};
};

}  // namespace

void measureDecoding(const Settings& settings, Table& table) {
  const std::string message = makeCbor(1);
  const std::string frame = makeFrame(1);
  const std::size_t count = settings.count(kDecodes);
  std::vector<Peer> peers{{"bare walk", &bareWalk}, {"nlohmann", &nlohmannJson}};
#ifdef TARN_HAVE_LIBCBOR
  peers.push_back({"libcbor", &libcbor});
#endif
  Samples views;
  Samples dictionaries;
  Samples encodings;
  for (int round = 0; round < settings.rounds; ++round) {
    views.push_back(toViews(count, message));
    dictionaries.push_back(toRequest(count, frame));
    encodings.push_back(encoded(count, makeMessage(1)));
    for (Peer& peer : peers) {
      peer.samples.push_back(peer.measure(count, message));
    }
  }
  const auto row = [](const std::string& figure, const Samples& ours, const Peer& peer) {
    return Row{figure,
               nanoseconds(median(ours)),
               peer.name + " " + nanoseconds(median(peer.samples)),
               timesOfRounds(ours, peer.samples),
               "",
               {}};
  };
  Row toViewsRow = row("decoding a message, to views", views, peers.front());
  toViewsRow.target = "<= 300 ns";
  table.addWithTarget(toViewsRow, median(views), kViewsTarget);
  const std::string name = "decoding a request, to a finished dictionary";
  Row toDictionaryRow = row(name, dictionaries, peers.front());
  toDictionaryRow.target = "<= 600 ns";
  table.addWithTarget(toDictionaryRow, median(dictionaries), kDictionaryTarget);
  for (std::size_t i = 1; i < peers.size(); ++i) {
    table.add(row(name, dictionaries, peers[i]));
  }
  table.add({"encoding a message", nanoseconds(median(encodings)), {}, {}, "", {}});
}

}  // namespace tarn::bench
