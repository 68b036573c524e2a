// Limits: the bounds that the readers of untrusted input apply, gathered in one place.
//
// Each limit has a default and can be changed for one call through an options argument
// (JsonLimits for the JSON readers); there is no process-wide setter. A limit of ours has a
// message of its own that names it, so a refusal is never mistaken for a syntax error.
//
// Thread safety: plain values and constant texts.
#pragma once

#include <cstdint>

#include "sarn/base/Export.h"

namespace sarn {

// Bounds of the two JSON readers (Dictionary::FromJson* and JsonParser).
struct SARN_EXPORT JsonLimits {
  // Nesting depth: how many containers (objects and arrays) may be open at once; the
  // top-level object is level 1. The readers keep their open containers off the native stack,
  // but writing and comparing a tree recurse once per level, so this bound is what keeps those
  // walks safe for every tree a reader builds: at the default a whole read, write, compare and
  // release fits in a 256 KiB thread stack. A document nested exactly this deep is read; one
  // level deeper is refused with the message of kJsonDepthLimitFormat. A limit below 1 refuses
  // every document.
  static constexpr int kDefaultMaxDepth = 512;

  JsonLimits() : maxDepthM(kDefaultMaxDepth) {}
  explicit JsonLimits(int maxDepth) : maxDepthM(maxDepth) {}

  int maxDepthM;
};

// Format of the message of a refused nesting depth; %d is the limit in force.
SARN_EXPORT extern const char kJsonDepthLimitFormat[];  // "JSON nesting exceeds the depth limit of %d levels."

// The platform arrays under ArrayValue and under one name of a Dictionary hold at most this
// many values; a reader refuses a document that would need more rather than drop values.
constexpr unsigned kMaxValuesPerContainer = 65535;
SARN_EXPORT extern const char kJsonArrayLimitMessage[];  // "JSON array holds more than 65535 elements."
SARN_EXPORT extern const char kJsonRepeatedKeyLimitMessage[];  // "JSON object repeats a key more than 65535 times."

}  // namespace sarn
