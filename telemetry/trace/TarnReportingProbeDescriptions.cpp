// SPDX-License-Identifier: Apache-2.0
#include "telemetry/trace/TarnReportingProbeDescriptions.h"

#include "platform/Facilities.h"
#include "platform/FileSystem.h"
#include "plist/formats/PropertyList.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingTraceCategory,
                                   "TarnReportingSessionTraceWorker"};  // for which this is read

// What property-list files call such a value.
std::string_view className(plist::Kind kind) {
  switch (kind) {
    case plist::Kind::Bool:
      return "boolean";
    case plist::Kind::Signed:
    case plist::Kind::Unsigned:
      return "integer";
    case plist::Kind::Float:
    case plist::Kind::Double:
      return "real";
    case plist::Kind::Date:
      return "date";
    case plist::Kind::Text:
      return "string";
    case plist::Kind::Data:
      return "data";
    case plist::Kind::Array:
      return "array";
    case plist::Kind::Dictionary:
      return "dict";
    case plist::Kind::None:
      break;
  }
  return "(null)";
}

}  // namespace

std::optional<std::vector<plist::Dictionary>> readProbeDescriptions(std::string_view path) {
  const auto file = TarnReportingFacilities().fileSystem.readFile(path, plist::kMaximumPropertyListBytes);
  if (file.failed()) {
    kLog(LogLevel::Error, "%@ failed to get SkeinProbes from %@", file.error->text, path);
    return std::nullopt;
  }
  const plist::PropertyListReading reading = plist::readPropertyList(file.value);
  if (reading.fault) {
    kLog(LogLevel::Error, "%@ failed to get SkeinProbes from %@", reading.fault->description(), path);
    return std::nullopt;
  }
  const plist::ValueView root = reading.value;
  if (root.kind() == plist::Kind::Dictionary) return std::vector<plist::Dictionary>{root.dictionary()};
  if (root.kind() != plist::Kind::Array) {
    kLog(LogLevel::Error, "unsupported root class %@", className(root.kind()));
    return std::nullopt;
  }
  std::vector<plist::Dictionary> descriptions;
  for (const plist::ValueView& item : root.array()) {
    if (item.kind() == plist::Kind::Dictionary) {
      descriptions.push_back(item.dictionary());
    } else {
      kLog(LogLevel::Error, "unsupported class %@ of a probe in %@", className(item.kind()), path);
    }
  }
  return root.array().empty() ? std::nullopt : std::optional(std::move(descriptions));
}

}  // namespace tarn
