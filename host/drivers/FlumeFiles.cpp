// SPDX-License-Identifier: Apache-2.0
#include "host/drivers/FlumeFiles.h"

#include <sys/stat.h>

#include <cerrno>
#include <iterator>
#include <utility>

#include "host/log/PrefixedLog.h"
#include "host/system/FolderNames.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"
#include "plist/EscapedText.h"

namespace tarn::linux_host {

using platform::FlumeSamples;

namespace {

constexpr std::string_view kModule = "FlumeFiles";
constexpr std::string_view kSuffix = ".json";

Error gone() {
  return {ENOENT, "is missing"};
}

// Why a file or folder can't be read.
Error unreadable(const Error& error) {
  return error.code == ENOENT ? gone() : errorOf("can't be read", error);
}

bool isChannelFile(std::string_view name) {
  return name.size() > kSuffix.size() && name.ends_with(kSuffix) && !name.starts_with('.');
}

}  // namespace

FlumeFiles::FlumeFiles(std::string folder, platform::Log& log, const FlumeFilesBounds& bounds)
    : folder_(std::move(folder)), log_(log), bounds_(bounds) {}

FlumeSamples FlumeFiles::read() {
  Gathered gathered;
  Complaints now;
  const auto found = folderNames(folder_, bounds_.files, isChannelFile);
  if (found.failed() && found.error->code != ENOENT) {
    now[""] = unreadable(*found.error);
  } else if (!found.value.complete) {
    now[""] = Error{0, "holds more than " + std::to_string(bounds_.files) + " files, the others are left out"};
  }
  for (const std::string& name : found.value.names) {
    Status read = readFile(name, gathered);
    // One that went while we looked is like one that wasn't there, unless it was there before.
    if (read.code() != ENOENT || last_.contains(name)) {
      now[name] = std::move(read);
    }
  }
  if (!now.contains("")) {  // or it may be there all the same
    for (const auto& [name, complaint] : last_) {
      if (!name.empty()) {
        now.emplace(name, gone());
      }
    }
  }
  tell(now);
  // What is gone was told and is forgotten.
  std::erase_if(now, [](const auto& each) { return each.second.code() == ENOENT; });
  last_ = std::move(now);
  return {std::make_move_iterator(gathered.channels.begin()), std::make_move_iterator(gathered.channels.end())};
}

// Adds the file's channels. An error is the complaint about it.
Status FlumeFiles::readFile(const std::string& name, Gathered& gathered) const {
  const std::string path = folder_ + "/" + name;
  struct stat facts {};
  // Looked at before it is opened: opening a device can do something.
  if (::stat(path.c_str(), &facts) != 0) return unreadable(lastSystemError());
  if (!S_ISREG(facts.st_mode)) return Error{0, "is not a plain file"};
  const auto [content, error] = readSmallFile(path, bounds_.fileBytes);
  if (error.code() == EFBIG) return Error{EFBIG, "is larger than " + std::to_string(bounds_.fileBytes) + " bytes"};
  if (error.failed()) return unreadable(*error);
  gathered.bytes += content.size();
  if (gathered.bytes > bounds_.bytes) {
    return Error{0, "is left out: there are more than " + std::to_string(bounds_.bytes) + " bytes of files"};
  }
  return takeChannels(parseFlumeFile(content, bounds_.file), gathered);
}

Status FlumeFiles::takeChannels(Result<FlumeSamples> reading, Gathered& gathered) const {
  if (gathered.channels.size() + reading.value.size() > bounds_.channels) {
    return Error{0, "is left out: there are more than " + std::to_string(bounds_.channels) + " channels"};
  }
  std::size_t doubles = 0;
  for (platform::FlumeChannel& channel : reading.value) {
    if (gathered.names.contains(&channel.name)) {
      ++doubles;
    } else {
      gathered.channels.push_back(std::move(channel));
      gathered.names.insert(&gathered.channels.back().name);
    }
  }
  if (reading.ok() && doubles > 0) {
    return Error{0, "holds " + std::to_string(doubles) + " channels that an earlier file has"};
  }
  return std::move(reading.error);
}

void FlumeFiles::tell(const Complaints& now) const {
  for (const auto& [name, complaint] : now) {
    const auto before = last_.find(name);
    if (complaint.failed() && (before == last_.end() || before->second != complaint)) {
      complain(name, *complaint);
    }
  }
}

void FlumeFiles::complain(const std::string& name, const Error& complaint) const {
  std::string text = name.empty() ? "driver channels: the folder " : "driver channels: the file ";
  plist::appendEscapedControls(text, name.empty() ? folder_ : name);
  text += ' ';
  text += complaint.text;
  logPrefixed(log_, kDriverCategory, platform::LogLevel::Error, kModule, text);
}

}  // namespace tarn::linux_host
