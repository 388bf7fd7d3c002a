// SPDX-License-Identifier: Apache-2.0
// Reports: messages that an engine posts without knowing a key, one operation each. docs/messages.md lists them.
//
//   const tarnreporting::Reports reports(session);         // once; throws tarnreporting::Error
//   reports.outputRunning(writer, 0.5, "Speaker");         // in the audio thread
//
// Each posts one message as Writer::post() does, with the time of the event in nanoseconds since 1970 UTC, or with 0
// that of the call. The reports may not be used after their session ended.
//
// Made by tools/dictionary/generate.py from dictionary/messages.toml: change that, not this.
#pragma once

#include <tarnreporting.hpp>
#include <tarnreporting_reports.h>

#include <cstdint>

namespace tarnreporting {

// clang-format off
// The reports of one session. Holds pointers alone: copies report to the same session, and all threads may use one,
// each with its own writer.
class Reports {
 public:
  // Declares the shapes of all reports, each of which counts among the client's 1024. Throws Error where the library
  // refuses one. Allocates: not for real-time threads; everything else here is for them.
  explicit Reports(const Session& session) {
    if (const int code = tarnreporting_reports_declare(session.raw(), &reports_); code != TARNREPORTING_OK) {
      throw Error(code);
    }
  }

  // Output runs from now on, at this volume (0 to 1), on this route. Posts Playback Start: session_output_running =
  // true, KvSessionVolume = `volume`, active_devices = `route`.
  Result outputRunning(Writer& writer, double volume, const char* route, std::uint64_t stamp = 0) const noexcept {
    return Result(tarnreporting_report_output_running_at(writer.raw(), &reports_, stamp, volume, route));
  }

  // Output runs no more. Posts Playback Stop: session_output_running = false.
  Result outputStopped(Writer& writer, std::uint64_t stamp = 0) const noexcept {
    return Result(tarnreporting_report_output_stopped_at(writer.raw(), &reports_, stamp));
  }

  // The volume is this from now on, 0 to 1. Posts Volume Generic: KvSessionVolume = `volume`.
  Result volumeChanged(Writer& writer, double volume, std::uint64_t stamp = 0) const noexcept {
    return Result(tarnreporting_report_volume_changed_at(writer.raw(), &reports_, stamp, volume));
  }

  // These devices play or record from now on. Posts RouteChange Generic: active_devices = `route`.
  Result routeChanged(Writer& writer, const char* route, std::uint64_t stamp = 0) const noexcept {
    return Result(tarnreporting_report_route_changed_at(writer.raw(), &reports_, stamp, route));
  }

  // Input runs from now on, on this route, with this voice codec at this sampling rate in Hz. Posts Input Start:
  // session_input_running = true, active_devices = `route`, vp_config_primary_vocoder = `codec`,
  // vp_config_primary_vocoderFs = `rate`.
  Result inputRunning(Writer& writer, const char* route, const char* codec, std::uint32_t rate,
                      std::uint64_t stamp = 0) const noexcept {
    return Result(tarnreporting_report_input_running_at(writer.raw(), &reports_, stamp, route, codec, rate));
  }

  // The voice codec is this from now on, at this sampling rate in Hz. Posts Input Setup: vp_config_primary_vocoder =
  // `codec`, vp_config_primary_vocoderFs = `rate`.
  Result codecChanged(Writer& writer, const char* codec, std::uint32_t rate, std::uint64_t stamp = 0) const noexcept {
    return Result(tarnreporting_report_codec_changed_at(writer.raw(), &reports_, stamp, codec, rate));
  }

  // Input runs no more. Posts Input Stop: session_input_running = false.
  Result inputStopped(Writer& writer, std::uint64_t stamp = 0) const noexcept {
    return Result(tarnreporting_report_input_stopped_at(writer.raw(), &reports_, stamp));
  }

  // A cycle came too late, or a buffer ran empty: its size in frames, and which cycle it was. Posts IO Error:
  // issue_type = "overload", smallest_buffer_frame_size = `frames`, io_cycle = `cycle`.
  Result overload(Writer& writer, std::int64_t frames, std::int64_t cycle, std::uint64_t stamp = 0) const noexcept {
    return Result(tarnreporting_report_overload_at(writer.raw(), &reports_, stamp, frames, cycle));
  }

  // Something else went wrong; what, in a word or two. Posts Error Error: issue_type = `what`.
  Result error(Writer& writer, const char* what, std::uint64_t stamp = 0) const noexcept {
    return Result(tarnreporting_report_error_at(writer.raw(), &reports_, stamp, what));
  }

  // What the session was for is over, and was active for so many seconds. Posts Generic Stop: session_duration =
  // `seconds`.
  Result sessionDuration(Writer& writer, double seconds, std::uint64_t stamp = 0) const noexcept {
    return Result(tarnreporting_report_session_duration_at(writer.raw(), &reports_, stamp, seconds));
  }

 private:
  tarnreporting_reports reports_ = {};
};
// clang-format on

}  // namespace tarnreporting
