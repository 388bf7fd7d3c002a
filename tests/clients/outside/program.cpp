// SPDX-License-Identifier: Apache-2.0
// The same with the C++ header.
#include <cstdio>
#include <optional>
#include <tarnreporting.hpp>
#include <tarnreporting_messages.hpp>
#include <tarnreporting_reports.hpp>
#include <utility>

int main() {
  tarnreporting::Client opened;
  tarnreporting::Client client = std::move(opened);
  std::uint64_t posted = 0;
  {
    tarnreporting::Session session = client.begin({7, "sys.oxbow.music", {{"bluetooth", true}, {"rate", 48000}}});
    const tarnreporting::Shape volume =
        session.shape(14, 16, {{"volume", tarnreporting::Kind::Double}, {"route", tarnreporting::Kind::Text}});
    tarnreporting::Writer writer = client.writer(4096);
    static_assert(noexcept(writer.post(volume, 0.5, "BuiltInSpeaker")));
    if (!writer.post(volume, 0.5, "BuiltInSpeaker").ok() || writer.post(volume, "no number", 1).ok()) return 1;
    const tarnreporting::Reports reports(session);
    if (!reports.outputRunning(writer, 0.5, "Speaker").ok()) return 1;
    if (writer.post(session, 14, 16, {{tarnreporting::keys::kKvSessionVolume.data(), 0.5}, {"", 1}}).ok()) return 1;
    posted = client.state().posted;
    try {
      session.shape(14, 16, {{"", tarnreporting::Kind::Double}});
      return 1;
    } catch (const tarnreporting::Error& error) {
      if (error.result().code() != TARNREPORTING_ARGUMENT) return 1;
    }
  }
  std::printf("posted %d, left %d\n", static_cast<int>(posted),
              static_cast<int>(client.close(std::chrono::milliseconds(10))));
  return 0;
}
