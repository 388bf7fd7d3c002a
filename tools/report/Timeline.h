// SPDX-License-Identifier: Apache-2.0
// Timeline: a session's lanes over its time. Stateless. Threads: any.
#pragma once

#include "tools/report/Markup.h"
#include "tools/report/Picture.h"
#include "tools/report/SessionPicture.h"

namespace tarn::report {

// Lanes without anything in them are left out. The lanes of the picture are drawn as they are: who has many items thins
// them first.
void drawTimeline(Markup& markup, const PictureHead& head, const SessionPicture& session);

}  // namespace tarn::report
