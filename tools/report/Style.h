// SPDX-License-Identifier: Apache-2.0
// Style: the page's style sheet: light, dark, and dark on white where it is printed. Constant. Threads: any.
#pragma once

#include <string_view>

namespace tarn::report {

// Without a "<" or an "&", so that HTML and XML read the same. The colours are declared first, light and then dark, as
// --NAME: #rrggbb; texts and what is drawn contrast enough with the ground for tired eyes (4.5 and 3 to 1).
extern const std::string_view kStyleSheet;

}  // namespace tarn::report
