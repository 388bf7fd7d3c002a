// SPDX-License-Identifier: Apache-2.0
#include "host/log/JournalOutput.h"

#include <sys/socket.h>
#include <sys/un.h>

#include <array>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <utility>

#include "host/log/JournalCatalog.h"
#include "host/log/LogClient.h"
#include "host/system/SystemError.h"
#include "plist/EscapedText.h"

namespace tarn::linux_host {

namespace {

constexpr std::array<const char*, 4> kPriorities{"7", "6", "5", "3"};  // by level
// So that the largest entry is one datagram.
constexpr int kSendBufferBytes = 8 << 20;

void addField(std::string& out, std::string_view name, std::string_view value) {
  out += name;
  if (value.find('\n') == std::string_view::npos) {
    out += '=';
  } else {
    out += '\n';
    for (unsigned shift = 0; shift < 64; shift += 8) {
      out += static_cast<char>((std::uint64_t{value.size()} >> shift) & 0xFFU);
    }
  }
  out += value;
  out += '\n';
}

// On whose behalf the thread works that logs.
void addClient(std::string& out, std::int64_t session) {
  const LogClient client = LogClientScope::current();
  if (client.connection != 0) {
    addField(out, "TARN_PID", std::to_string(client.process));
    addField(out, "TARN_UID", std::to_string(client.user));
  }
  if (session != 0) {
    addField(out, "TARN_SESSION", std::to_string(session));
  }
}

bool fillAddress(const std::string& path, sockaddr_un& address) {
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof address.sun_path) return false;
  std::memcpy(address.sun_path, path.data(), path.size());
  return true;
}

const sockaddr* generic(const sockaddr_un& address) {
  return reinterpret_cast<const sockaddr*>(&address);  // what the system's calls want
}

UniqueDescriptor makeSocket() {
  return UniqueDescriptor(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
}

}  // namespace

JournalOutput::JournalOutput(std::string socketPath, SessionSource sessionOf)
    : path_(std::move(socketPath)), sessionOf_(std::move(sessionOf)) {}

Status JournalOutput::open() {
  sockaddr_un address{};
  socket_ = makeSocket();
  const UniqueDescriptor probe = makeSocket();
  if (socket_ && probe && fillAddress(path_, address) &&
      ::connect(probe.get(), generic(address), sizeof address) == 0) {
    ::setsockopt(socket_.get(), SOL_SOCKET, SO_SNDBUF, &kSendBufferBytes, sizeof kSendBufferBytes);
    return {};
  }
  const int error = errno;
  return Error{error, path_ + errorSuffix(error)};
}

std::string JournalOutput::formed(double, const platform::LogEntry& entry) const {
  std::string text;
  plist::appendPrintable(text, entry.text, plist::LineEnds::Kept);
  std::string fields;
  fields.reserve(text.size() + 160);
  addField(fields, "MESSAGE", text);
  addField(fields, "PRIORITY", kPriorities[static_cast<std::size_t>(entry.level)]);
  addField(fields, "TARN_CATEGORY", entry.category.code);
  addField(fields, "TARN_SUBSYSTEM", entry.category.subsystem);
  if (!entry.module.empty()) {
    addField(fields, "CODE_FILE", entry.module);
    addField(fields, "CODE_LINE", std::to_string(entry.line));
  }
  addField(fields, "SYSLOG_IDENTIFIER", "tarnreportingd");
  if (const std::string_view id = messageIdOf(platform::LogConditionScope::current()); !id.empty()) {
    addField(fields, "MESSAGE_ID", id);
  }
  addClient(fields, sessionOf_ ? sessionOf_() : 0);
  return fields;
}

int JournalOutput::write(std::string_view bytes) {
  sockaddr_un address{};
  fillAddress(path_, address);
  ssize_t sent = 0;
  do {
    sent = ::sendto(socket_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT, generic(address),
                    sizeof address);
  } while (sent < 0 && errno == EINTR);
  return sent < 0 ? errno : 0;
}

}  // namespace tarn::linux_host
