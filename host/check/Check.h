// SPDX-License-Identifier: Apache-2.0
// Check: what one look at the installation found, and what such a look is about.
//
// A check writes and makes nothing, takes no lock and starts nothing, so it may be asked beside a running service, and
// by whoever may read what it looks at. Threads: any.
#pragma once

#include <string>
#include <vector>

#include "host/settings/HostConfiguration.h"
#include "host/settings/ServiceOptions.h"

namespace tarn::linux_host {

struct Check {
  std::string name;  // of what was looked at, one word
  bool isGood = true;
  // What is there, or why it won't do and what to do about it. One line.
  std::string text;
};

inline Check good(std::string name, std::string text) {
  return {std::move(name), true, std::move(text)};
}
inline Check bad(std::string name, std::string text) {
  return {std::move(name), false, std::move(text)};
}

// What is asked about: a service that would be started with these options.
struct CheckSubject {
  ServiceOptions options;
  bool isHandedOver = false;  // the socket: nothing of it is for the service to make
  // Where the service manager's units are, in the order in which it looks; none where there is no such manager.
  std::vector<std::string> unitFolders;
};

// The subject on this machine, for the manager that runs on it.
CheckSubject subjectOf(ServiceOptions options);
// All of them, in an order in which what stands first is to be mended first.
std::vector<Check> checkAll(const CheckSubject& subject);
bool areGood(const std::vector<Check>& checks) noexcept;
// "good NAME: TEXT" or "bad NAME: TEXT", printable in one line.
std::string lineOf(const Check& check);

}  // namespace tarn::linux_host
