// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/core/Identity.h"

#include <charconv>
#include <cstdio>
#include <tarnreporting_messages.hpp>

namespace tarn::streams {

namespace {

namespace keys = tarnreporting::keys;

constexpr std::size_t kAddressLength = 17;  // six pairs of digits and what is between them
constexpr std::size_t kMostText = 1024;     // that a report may carry

std::string_view either(const Properties& node, const Properties& client, std::string_view key) {
  const std::string_view own = textOf(node, key);
  return own.empty() ? textOf(client, key) : own;
}

bool isHexDigit(char character) {
  return (character >= '0' && character <= '9') || (character >= 'a' && character <= 'f') ||
         (character >= 'A' && character <= 'F');
}

bool isAddress(std::string_view text) {
  if (text.size() < kAddressLength) return false;
  for (std::size_t i = 0; i < kAddressLength; ++i) {
    const bool fits =
        i % 3 == 2 ? (text[i] == '_' || text[i] == ':' || text[i] == '-') && text[i] == text[2] : isHexDigit(text[i]);
    if (!fits) return false;
  }
  return true;
}

// FNV-1a, folded: enough to tell the devices of one desk apart, too little to tell the address.
std::string shortNumber(std::string_view text) {
  std::uint32_t hash = 2166136261U;
  for (const char character : text) {
    hash = (hash ^ static_cast<unsigned char>(character)) * 16777619U;
  }
  char room[8];
  const int length = std::snprintf(room, sizeof room, "%04x", (hash ^ (hash >> 16U)) & 0xffffU);
  return std::string(room, static_cast<std::size_t>(length));
}

// A bound in bytes, but never in the middle of a character.
std::string cut(std::string_view text) {
  std::size_t length = std::min(text.size(), kMostText);
  while (length < text.size() && length > 0 && (static_cast<unsigned char>(text[length]) & 0xC0U) == 0x80U) {
    --length;
  }
  return std::string(text.substr(0, length));
}

void addText(Fields& fields, std::string_view key, std::string_view text) {
  if (!text.empty()) {
    fields.push_back({key, cut(text)});
  }
}

void addNumber(Fields& fields, std::string_view key, std::string_view text) {
  std::int64_t number = 0;
  const auto read = std::from_chars(text.data(), text.data() + text.size(), number);
  if (!text.empty() && read.ec == std::errc()) {
    fields.push_back({key, number});
  }
}

}  // namespace

std::string applicationOf(const Properties& node, const Properties& client) {
  for (const std::string_view key : {"application.id", "application.process.binary"}) {
    if (const std::string_view text = either(node, client, key); !text.empty()) return cut(text);
  }
  const std::string_view name = textOf(node, "node.name");
  return name.empty() ? "Unknown" : cut(name);
}

BeginSession sessionOf(StreamNumber stream, const Properties& node, const Properties& client, const Rules& rules) {
  const std::string_view role = either(node, client, "media.role");
  std::string application = applicationOf(node, client);
  const std::uint16_t type = rules.serviceTypeOf(role, application);
  BeginSession begin{stream, type, std::move(application), {}};
  Fields& fields = begin.configuration;
  addText(fields, keys::kMediaClass, textOf(node, "media.class"));
  addText(fields, keys::kMediaRole, role);
  addText(fields, keys::kStreamNode, textOf(node, "node.name"));
  addText(fields, keys::kApplicationProcessBinary, either(node, client, "application.process.binary"));
  std::string_view process = either(node, client, "application.process.id");
  if (process.empty()) {
    process = textOf(client, "pipewire.sec.pid");
  }
  addNumber(fields, keys::kApplicationProcessId, process);
  addText(fields, keys::kPortalAppId, either(node, client, "pipewire.access.portal.app_id"));
  addText(fields, keys::kRequestedLatency, textOf(node, "node.latency"));
  if (rules.mediaNames) {
    addText(fields, keys::kMediaName, textOf(node, "media.name"));
  }
  return begin;
}

std::string withoutAddress(std::string_view name) {
  std::string text;
  for (std::size_t i = 0; i < name.size();) {
    const bool begins = i == 0 || !isHexDigit(name[i - 1]);
    if (begins && isAddress(name.substr(i))) {
      text += shortNumber(name.substr(i, kAddressLength));
      i += kAddressLength;
    } else {
      text += name[i++];
    }
  }
  return text;
}

}  // namespace tarn::streams
