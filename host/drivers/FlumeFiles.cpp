#include "host/drivers/FlumeFiles.h"

#include <sys/stat.h>

#include <cerrno>
#include <iterator>
#include <utility>

#include "host/log/PrefixedLog.h"
#include "host/system/FolderNames.h"
#include "host/system/SmallFile.h"
#include "plist/EscapedText.h"

namespace tarn::linux_host {

using platform::FlumeSamples;

namespace {

constexpr std::string_view kModule = "FlumeFiles";
constexpr std::string_view kSuffix = ".json";
constexpr const char* kGone = "is missing";

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
    now[""] = "can't be read" + errorSuffix(*found.error);
  } else if (!found.value.complete) {
    now[""] = "holds more than " + std::to_string(bounds_.files) + " files, the others are left out";
  }
  for (const std::string& name : found.value.names) {
    std::string complaint = readFile(name, gathered);
    // One that went while we looked is like one that wasn't there, unless it was there before.
    if (complaint != kGone || last_.contains(name)) {
      now[name] = std::move(complaint);
    }
  }
  if (!now.contains("")) {  // or it may be there all the same
    for (const auto& [name, complaint] : last_) {
      if (!name.empty()) {
        now.emplace(name, kGone);
      }
    }
  }
  tell(now);
  // What is gone was told and is forgotten.
  std::erase_if(now, [](const auto& each) { return each.second == kGone; });
  last_ = std::move(now);
  return {std::make_move_iterator(gathered.channels.begin()), std::make_move_iterator(gathered.channels.end())};
}

// Adds the file's channels; its complaint, empty when there is none.
std::string FlumeFiles::readFile(const std::string& name, Gathered& gathered) const {
  const std::string path = folder_ + "/" + name;
  struct stat facts {};
  // Looked at before it is opened: opening a device can do something.
  if (::stat(path.c_str(), &facts) != 0) {
    return errno == ENOENT ? kGone : "can't be read" + errorSuffix(errno);
  }
  if (!S_ISREG(facts.st_mode)) {
    return "is not a plain file";
  }
  const auto [content, error] = readSmallFile(path, bounds_.fileBytes);
  if (error && error->code == EFBIG) {
    return "is larger than " + std::to_string(bounds_.fileBytes) + " bytes";
  }
  if (error) {
    return error->code == ENOENT ? kGone : "can't be read" + errorSuffix(*error);
  }
  gathered.bytes += content.size();
  if (gathered.bytes > bounds_.bytes) {
    return "is left out: there are more than " + std::to_string(bounds_.bytes) + " bytes of files";
  }
  return takeChannels(parseFlumeFile(content, bounds_.file), gathered);
}

std::string FlumeFiles::takeChannels(FlumeFileReading reading, Gathered& gathered) const {
  if (gathered.channels.size() + reading.channels.size() > bounds_.channels) {
    return "is left out: there are more than " + std::to_string(bounds_.channels) + " channels";
  }
  std::size_t doubles = 0;
  for (platform::FlumeChannel& channel : reading.channels) {
    if (gathered.names.contains(&channel.name)) {
      ++doubles;
    } else {
      gathered.channels.push_back(std::move(channel));
      gathered.names.insert(&gathered.channels.back().name);
    }
  }
  if (reading.complaint.empty() && doubles > 0) {
    return "holds " + std::to_string(doubles) + " channels that an earlier file has";
  }
  return std::move(reading.complaint);
}

void FlumeFiles::tell(const Complaints& now) const {
  for (const auto& [name, complaint] : now) {
    const auto before = last_.find(name);
    if (!complaint.empty() && (before == last_.end() || before->second != complaint)) {
      complain(name, complaint);
    }
  }
}

void FlumeFiles::complain(const std::string& name, const std::string& complaint) const {
  std::string text = name.empty() ? "driver channels: the folder " : "driver channels: the file ";
  plist::appendEscapedControls(text, name.empty() ? folder_ : name);
  text += ' ';
  text += complaint;
  logPrefixed(log_, kDriverCategory, platform::LogLevel::Error, kModule, text);
}

}  // namespace tarn::linux_host
