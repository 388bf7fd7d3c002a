// SPDX-License-Identifier: Apache-2.0
// FileNameText: texts of clients as parts of file names. Stateless. Threads: any.
#pragma once

#include <algorithm>
#include <string>

namespace tarn {

// The text with everything but ASCII letters, digits, '.', '_' and '-' replaced by '_', byte by byte: nothing of it
// leads out of a folder, hides a file from a listing's reader or needs quotes in a shell. A character of several bytes
// becomes as many '_'. Different texts may give the same name, and an empty one stays empty, so whoever names a file
// adds what makes it its own. "." and ".." stay as they are: the text is only ever a part of a name. The length isn't
// bounded here.
inline std::string fileNameText(std::string text) {
  std::replace_if(
      text.begin(), text.end(),
      [](char character) {
        const bool isLetter = (character >= 'a' && character <= 'z') || (character >= 'A' && character <= 'Z');
        const bool isDigit = character >= '0' && character <= '9';
        return !isLetter && !isDigit && character != '.' && character != '_' && character != '-';
      },
      '_');
  return text;
}

}  // namespace tarn
