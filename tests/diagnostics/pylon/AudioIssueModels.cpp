// SPDX-License-Identifier: Apache-2.0
#include "tests/diagnostics/pylon/AudioIssueModels.h"

#include <bitset>

namespace pylonmetrics::testing {

namespace {

using Bytes = std::deque<unsigned char>;

// Why reading ends: nothing for good input.
struct Cut {};

unsigned char take(Bytes& bytes) {
  if (bytes.empty()) throw Cut();
  const unsigned char byte = bytes.front();
  bytes.pop_front();
  return byte;
}

std::uint64_t takeVarint(Bytes& bytes) {
  std::bitset<70> bits;
  for (std::size_t group = 0; group < 10; ++group) {
    const std::bitset<8> byte(take(bytes));
    for (std::size_t bit = 0; bit < 7; ++bit) {
      bits[group * 7 + bit] = byte[bit];
    }
    if (!byte[7]) {
      std::uint64_t value = 0;
      for (std::size_t bit = 64; bit-- > 0;) {
        value = value * 2 + (bits[bit] ? 1 : 0);
      }
      return value;
    }
  }
  return 0;
}

std::string takeString(Bytes& bytes) {
  std::string text;
  for (std::uint64_t left = takeVarint(bytes); left > 0; --left) {
    text += static_cast<char>(take(bytes));
  }
  return text;
}

void takeUnknown(Bytes& bytes, std::uint64_t number, std::uint64_t type, int depth) {
  if (type == 0) {
    takeVarint(bytes);
  } else if (type == 1 || type == 5) {
    for (int i = 0; i < (type == 1 ? 8 : 4); ++i) {
      take(bytes);
    }
  } else if (type == 2) {
    takeString(bytes);
  } else if (type == 3 && depth < 100) {
    for (;;) {
      const std::uint64_t tag = takeVarint(bytes);
      if (tag % 8 == 4) {
        if (tag / 8 == number) return;
        throw Cut();
      }
      takeUnknown(bytes, tag / 8, tag % 8, depth + 1);
    }
  } else {
    throw Cut();
  }
}

// Whether it goes on after this field.
bool takeField(Bytes& bytes, ModelIssue& issue) {
  const std::uint64_t tag = takeVarint(bytes);
  if (tag % 8 == 4) return false;
  if (tag / 8 == 1) {
    issue.timestamp = 0;
    issue.timestamp = takeVarint(bytes);
  } else if (tag / 8 == 2) {
    issue.duration = 0;
    issue.duration = static_cast<std::int32_t>(static_cast<std::uint32_t>(takeVarint(bytes) % (1ULL << 32U)));
  } else if (tag / 8 == 3) {
    issue.issuetype = takeString(bytes);
  } else if (tag / 8 == 4) {
    issue.node = takeString(bytes);
  } else if (tag / 8 == 5) {
    issue.rtaidclient = takeString(bytes);
  } else {
    takeUnknown(bytes, tag / 8, tag % 8, 0);
  }
  return true;
}

}  // namespace

ModelIssue modelOf(const AudioIssueDetected& record) {
  ModelIssue issue;
  if (record.hasTimestamp()) {
    issue.timestamp = record.timestamp();
  }
  issue.duration = record.duration();
  issue.issuetype = record.issuetype();
  issue.node = record.node();
  issue.rtaidclient = record.rtaidclient();
  return issue;
}

AudioIssueDetected recordOf(const ModelIssue& issue) {
  AudioIssueDetected record;
  if (issue.timestamp) {
    record.setTimestamp(*issue.timestamp);
  }
  record.setDuration(issue.duration);
  record.setIssuetype(issue.issuetype);
  record.setNode(issue.node);
  record.setRtaidclient(issue.rtaidclient);
  return record;
}

std::string varint(std::uint64_t value) {
  std::string bytes;
  do {
    const std::uint64_t group = value % 128;
    value /= 128;
    bytes += static_cast<char>(static_cast<unsigned char>(group + (value > 0 ? 128 : 0)));
  } while (value > 0);
  return bytes;
}

std::string longVarint(std::uint64_t value, std::size_t bytes) {
  std::string text = varint(value);
  while (text.size() < bytes) {
    text.back() = static_cast<char>(static_cast<unsigned char>(text.back()) | 0x80U);
    text += '\0';
  }
  return text;
}

std::string encode(const ModelIssue& issue) {
  std::string bytes;
  if (issue.timestamp) {
    bytes += "\x08" + varint(*issue.timestamp);
  }
  // A negative duration as the 64 bits of the same number.
  bytes += "\x10" + varint(issue.duration < 0 ? 0 - static_cast<std::uint64_t>(-std::int64_t{issue.duration})
                                              : static_cast<std::uint64_t>(issue.duration));
  // NOLINTBEGIN(modernize-raw-string-literal): tags are bytes
  bytes += "\x1a" + varint(issue.issuetype.size()) + issue.issuetype;
  bytes += "\x22" + varint(issue.node.size()) + issue.node;
  bytes += "\x2a" + varint(issue.rtaidclient.size()) + issue.rtaidclient;
  // NOLINTEND(modernize-raw-string-literal)
  return bytes;
}

bool decode(const std::string& bytes, ModelIssue& issue) {
  Bytes left(bytes.begin(), bytes.end());
  try {
    while (!left.empty() && takeField(left, issue)) {
    }
  } catch (const Cut&) {
    return false;
  }
  return true;
}

std::uint64_t RandomIssues::number() {
  return random_() >> below(64);
}

std::string RandomIssues::text() {
  std::string bytes(below(4) == 0 ? below(300) : below(12), '\0');
  for (char& byte : bytes) {
    byte = static_cast<char>(static_cast<unsigned char>(below(256)));
  }
  return bytes;
}

ModelIssue RandomIssues::issue() {
  ModelIssue issue;
  if (below(2) == 0) {
    issue.timestamp = number();
  }
  issue.duration = static_cast<std::int32_t>(static_cast<std::uint32_t>(number()));
  issue.issuetype = text();
  issue.node = text();
  issue.rtaidclient = text();
  return issue;
}

std::string RandomIssues::field(int depth) {
  const std::uint64_t fieldNumber = below(8) == 0 ? number() >> 3U : below(9);
  std::uint64_t type = below(20) == 0 ? below(8) : below(4);
  if (fieldNumber >= 1 && fieldNumber <= 5 && below(8) != 0) {
    type = fieldNumber <= 2 ? 0 : 2;
  }
  const std::uint64_t tag = fieldNumber * 8 + type;
  std::string bytes = below(8) == 0 ? longVarint(tag, below(13)) : varint(tag);
  // Laid out as the reader will take it, more often than not.
  const bool known = depth == 0 && fieldNumber >= 1 && fieldNumber <= 5;
  const std::uint64_t layout = known ? (fieldNumber <= 2 ? 0 : 2) : type;
  if (layout == 0) {
    bytes += below(8) == 0 ? longVarint(number(), below(13)) : varint(number());
  } else if (layout == 1 || layout == 5) {
    bytes += std::string(layout == 1 ? 8 : 4, 'x');
  } else if (layout == 2) {
    const std::string content = text();
    bytes += varint(content.size() + (below(30) == 0 ? below(3) : 0)) + content;
  } else if (layout == 3) {
    for (std::uint64_t left = depth < 6 ? below(4) : 0; left > 0; --left) {
      bytes += field(depth + 1);
    }
    bytes += varint((below(20) == 0 ? below(9) : fieldNumber) * 8 + 4);
  }
  return bytes;
}

std::string RandomIssues::input() {
  std::string bytes;
  for (std::uint64_t left = below(8); left > 0; --left) {
    bytes += field(0);
  }
  if (!bytes.empty() && below(4) == 0) {
    bytes.resize(below(bytes.size()));
  }
  if (!bytes.empty() && below(4) == 0) {
    bytes[below(bytes.size())] = static_cast<char>(static_cast<unsigned char>(below(256)));
  }
  return bytes;
}

}  // namespace pylonmetrics::testing
