// A trace-analysis library that isn't whole: built once without its last two classes, once with a table cut short.
#include "host/traces/analysis/TraceAnalysisAbi.h"

namespace {

constexpr SkeinTraceModelV1 kTraceModel{sizeof(SkeinTraceModelV1), nullptr, nullptr};
constexpr SkeinSignpostDataModelV1 kSignpostDataModel{
    TARN_SHORT != 0 ? 8 : sizeof(SkeinSignpostDataModelV1), nullptr, nullptr, nullptr, nullptr, nullptr};

}  // namespace

// NOLINTBEGIN(readability-identifier-naming): the names say which class and version
extern "C" {

const SkeinTraceModelV1* SkeinTraceModel_V1() {
  return &kTraceModel;
}
const SkeinSignpostDataModelV1* SkeinSignpostDataModel_V1() {
  return &kSignpostDataModel;
}

}  // extern "C"
// NOLINTEND(readability-identifier-naming)
