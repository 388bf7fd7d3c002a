// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderTattleService.h"

#include <utility>

#include "recorder/Recorder.h"

namespace tarn::recorder {

namespace {

plist::Dictionary payloadOf(const platform::TattleDraft& draft) {
  plist::Array extensions;
  for (const std::string& identifier : draft.diagnosticExtensions) {
    extensions.append(identifier);
  }
  const plist::Dictionary component{
      {"name", draft.component.name}, {"version", draft.component.version}, {"identifier", draft.component.identifier}};
  return {{"title", draft.title},
          {"description", draft.description},
          {"component", component},
          {"reproducibility", draft.reproducibility},
          {"classification", draft.classification},
          {"extensions", extensions}};
}

}  // namespace

void RecorderTattleService::createDraft(const platform::TattleDraft& draft,
                                        const std::optional<std::string>& processName, std::string_view displayReason,
                                        Completion completion) {
  plist::Dictionary detail;
  if (processName) {
    detail.set("process", *processName);
  }
  detail.set("reason", displayReason);
  recorder_.record("tattle", "createDraft", payloadOf(draft), detail, clock_.epochSeconds());
  platform::Work complete([completion = std::move(completion)]() mutable { completion(Status()); });
  if (!completions_.add(std::move(complete))) {
    complete();
  }
}

}  // namespace tarn::recorder
