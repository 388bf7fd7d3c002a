// The border between the service and a trace-analysis library: plain structs and functions with C linkage, so that
// library and service may come from different compilers.
//
// A library has four classes. Each is a function named after the class and the version of its table,
// "SkeinTraceModel_V1" and so on, which returns the table of the class's operations. A later version of a table gets a
// function of its own beside the old one; a library that lacks a function, or whose table is shorter than `bytes` says
// here, lacks the class.
//
// Nothing is thrown across. What an operation returns belongs to the library and lives until its release; texts and
// probes live as long as what they were asked of. An operation that can fail fills in the failure and returns null.
// Threads: one at a time.
#pragma once

#include <cstdint>

extern "C" {

// UTF-8, not ended by a NUL.
struct SkeinText {
  const char* bytes;
  std::uint64_t size;
};

struct SkeinFailure {
  std::int64_t code;  // the system's own number, or 0
  char text[256];     // ended by a NUL
};

struct SkeinInterval {
  SkeinText subsystem;
  SkeinText name;
  std::int64_t durationTicks;
};

// What these are the library knows.
struct SkeinTrace;
struct SkeinSignpostData;
struct SkeinProbeList;
struct SkeinProbe;

struct SkeinTraceModelV1 {
  std::uint32_t bytes;  // of this struct
  SkeinTrace* (*open)(SkeinText location, SkeinFailure* failure);
  void (*release)(SkeinTrace* trace);
};

struct SkeinSignpostDataModelV1 {
  std::uint32_t bytes;
  // All intervals of the trace, which must outlive them.
  SkeinSignpostData* (*create)(const SkeinTrace* trace, SkeinFailure* failure);
  void (*release)(SkeinSignpostData* data);
  std::uint64_t (*intervalCount)(const SkeinSignpostData* data);
  SkeinInterval (*interval)(const SkeinSignpostData* data, std::uint64_t index);
  // The time model: what a tick of a duration is worth.
  double (*secondsPerTick)(const SkeinSignpostData* data);
};

struct SkeinSignpostPlistV1 {
  std::uint32_t bytes;
  // The probes that the descriptions ask for; a JSON array of objects. The trace must outlive them.
  SkeinProbeList* (*probesForDictionaries)(SkeinText descriptions, const SkeinTrace* trace, SkeinFailure* failure);
  void (*release)(SkeinProbeList* probes);
  std::uint64_t (*probeCount)(const SkeinProbeList* probes);
  const SkeinProbe* (*probe)(const SkeinProbeList* probes, std::uint64_t index);
  SkeinText (*name)(const SkeinProbe* probe);
  SkeinText (*kind)(const SkeinProbe* probe);  // the name of its class
  std::uint64_t (*childCount)(const SkeinProbe* probe);
  const SkeinProbe* (*child)(const SkeinProbe* probe, std::uint64_t index);
};

struct SkeinSignpostIntervalProbeV1 {
  std::uint32_t bytes;
  // 1 for a probe that is of this class, else 0. The rest is for such alone.
  std::int32_t (*isKindOf)(const SkeinProbe* probe);
  std::uint64_t (*eventCount)(const SkeinProbe* probe);
  SkeinInterval (*event)(const SkeinProbe* probe, std::uint64_t index);
};

using SkeinTraceModelEntry = const SkeinTraceModelV1* (*)();
using SkeinSignpostDataModelEntry = const SkeinSignpostDataModelV1* (*)();
using SkeinSignpostPlistEntry = const SkeinSignpostPlistV1* (*)();
using SkeinSignpostIntervalProbeEntry = const SkeinSignpostIntervalProbeV1* (*)();

}  // extern "C"
