// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Picture.h"

#include "tools/report/Scale.h"
#include "tools/report/Texts.h"

namespace tarn::report {

Picture::Picture(Markup& markup, const PictureHead& head, double height) : markup_(markup) {
  const std::string title = head.id + "-title";
  const std::string description = head.id + "-text";
  markup_.line().open("figure", {{"id", head.id}});
  markup_.open("svg", {{"xmlns", "http://www.w3.org/2000/svg"},
                       {"viewBox", "0 0 " + numberText(kPictureWidth) + " " + placeText(height)},
                       {"role", "img"},
                       {"aria-labelledby", title + " " + description}});
  markup_.element("title", {{"id", title}}, head.title);
  markup_.element("desc", {{"id", description}}, head.description);
}

Picture::~Picture() {
  markup_.close().close();
}

void Picture::box(const char* kind, double x, double y, double width, double height) {
  markup_.empty("rect", {{"class", kind},
                         {"x", placeText(x)},
                         {"y", placeText(y)},
                         {"width", placeText(width)},
                         {"height", placeText(height)}});
}

void Picture::line(const char* kind, double x1, double y1, double x2, double y2) {
  markup_.empty(
      "line",
      {{"class", kind}, {"x1", placeText(x1)}, {"y1", placeText(y1)}, {"x2", placeText(x2)}, {"y2", placeText(y2)}});
}

void Picture::steps(const char* kind, const std::string& points) {
  markup_.empty("polyline", {{"class", kind}, {"points", points}});
}

void Picture::text(const char* anchor, double x, double y, std::string_view text) {
  markup_.element("text", {{"class", anchor}, {"x", placeText(x)}, {"y", placeText(y)}}, text);
}

}  // namespace tarn::report
