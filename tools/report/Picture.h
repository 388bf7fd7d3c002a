// SPDX-License-Identifier: Apache-2.0
// Picture: one inline SVG picture with a title and a description for those who don't see it.
//
// Colours are classes of the page's style sheet, so that a picture follows light, dark and print. Places are in units
// of the picture, whose width is always the same. Owner: who draws. Threads: one at a time.
#pragma once

#include <string>
#include <string_view>

#include "tools/report/Markup.h"

namespace tarn::report {

inline constexpr double kPictureWidth = 920;

struct PictureHead {
  std::string id;  // unique in the page
  std::string title;
  std::string description;  // what is to be seen, in a sentence
};

class Picture {
 public:
  // Opens the figure and its picture; the destructor closes both.
  Picture(Markup& markup, const PictureHead& head, double height);
  ~Picture();
  Picture(const Picture&) = delete;
  Picture& operator=(const Picture&) = delete;

  // `kind` is a class of the style sheet.
  void box(const char* kind, double x, double y, double width, double height);
  void line(const char* kind, double x1, double y1, double x2, double y2);
  // Points are "x,y x,y".
  void steps(const char* kind, const std::string& points);
  // At its beginning ("start"), its middle or its end lies x.
  void text(const char* anchor, double x, double y, std::string_view text);

 private:
  Markup& markup_;
};

}  // namespace tarn::report
