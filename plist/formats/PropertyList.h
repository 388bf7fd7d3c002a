// SPDX-License-Identifier: Apache-2.0
// PropertyList: property-list files, as people and their tools write them, in the XML or the binary format.
//
// The bytes are not trusted. Whatever they are, reading ends with a value or with the first fault and its place, and
// stays within the bounds below: a file that names one object a million times is cut off like one that holds a million,
// and reading it takes no longer than its bytes are worth, since an object is read once however often it is named.
// Nothing outside the bytes is ever looked at.
//
// Threads: any; everything is stateless. Nothing is thrown.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

#include "plist/Value.h"

namespace tarn::plist {

constexpr std::size_t kMaximumPropertyListNesting = 64;  // the outermost container is level 1
constexpr std::size_t kMaximumPropertyListBytes = std::size_t{16} << 20U;
constexpr std::size_t kMaximumPropertyListValues = std::size_t{1} << 20U;
// Of all texts, keys and data together, counted at each place where they stand.
constexpr std::size_t kMaximumPropertyListContent = std::size_t{64} << 20U;
// A binary file names one text in many places at the price of a reference each. What comes out of one holds at most
// this much for each byte of the file, or as much as any small file may.
constexpr std::size_t kPropertyListContentPerByte = 32;
constexpr std::size_t kPropertyListContentOfSmallFile = std::size_t{4} << 20U;

// What is wrong, and where: a line of XML, counted from 1, or a byte of the binary format, counted from 0.
struct PropertyListFault {
  enum class Place { Line, Byte };

  Place place = Place::Line;
  std::size_t number = 0;
  std::string text;

  // "line 3: no such element: <float>", "byte 40: ..."
  std::string description() const;
};

// Either a value or a fault.
struct PropertyListReading {
  Value value;  // absent when there is a fault
  std::optional<PropertyListFault> fault;
};

// Reads either format: the binary one when the bytes begin as one, else XML.
PropertyListReading readPropertyList(std::string_view bytes);

}  // namespace tarn::plist
