// SPDX-License-Identifier: Apache-2.0
#include "host/system/ProgramVersion.h"

#include <link.h>

#include <cstddef>
#include <cstring>
#include <span>
#include <utility>

namespace tarn::linux_host {

namespace {

constexpr std::string_view kVersion = TARN_VERSION;
constexpr std::string_view kOwner{"GNU\0", 4};  // of the note, with its end

// What stands in a note takes a multiple of four bytes.
std::size_t padded(std::size_t bytes) {
  return (bytes + 3) / 4 * 4;
}

std::string hexadecimal(std::string_view bytes) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  std::string text;
  for (const char byte : bytes) {
    const auto value = static_cast<unsigned char>(byte);
    text += kDigits[value / 16];
    text += kDigits[value % 16];
  }
  return text;
}

// The identifier in a segment of notes, if it is there.
std::string_view identifierIn(std::string_view notes) {
  ElfW(Nhdr) header{};
  while (notes.size() >= sizeof header) {
    std::memcpy(&header, notes.data(), sizeof header);
    notes.remove_prefix(sizeof header);
    const std::size_t bytes = padded(header.n_namesz) + padded(header.n_descsz);
    if (bytes > notes.size()) break;
    if (header.n_type == NT_GNU_BUILD_ID && notes.substr(0, header.n_namesz) == kOwner) {
      return notes.substr(padded(header.n_namesz), header.n_descsz);
    }
    notes.remove_prefix(bytes);
  }
  return {};
}

// The first object is the program itself.
int takeIdentifier(dl_phdr_info* object, std::size_t, void* identifier) {
  for (const ElfW(Phdr) & segment : std::span(object->dlpi_phdr, object->dlpi_phnum)) {
    if (segment.p_type != PT_NOTE) continue;
    const auto* notes = reinterpret_cast<const char*>(object->dlpi_addr + segment.p_vaddr);
    if (const std::string_view found = identifierIn({notes, segment.p_memsz}); !found.empty()) {
      *static_cast<std::string*>(identifier) = hexadecimal(found);
    }
  }
  return 1;
}

}  // namespace

std::string buildIdentifier() {
  std::string identifier;
  ::dl_iterate_phdr(takeIdentifier, &identifier);
  return identifier;
}

std::string programVersion(std::string_view program, std::string_view commit, std::string_view build) {
  std::string text = std::string(program) + " " + std::string(kVersion);
  const char* before = " (";
  for (const auto& [what, value] : {std::pair("commit ", commit), std::pair("build ", build)}) {
    if (value.empty()) continue;
    text += before + std::string(what) + std::string(value);
    before = ", ";
  }
  return *before == ',' ? text + ")" : text;
}

}  // namespace tarn::linux_host
