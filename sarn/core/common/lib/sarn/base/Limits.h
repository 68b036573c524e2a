// Limits: every bound that the library's readers and converters apply to what they are given,
// with its default and its message, in one place.
//
// One value type, Limits, carries them. Every reader and converter that applies a bound takes a
// Limits the same way: an overload with a trailing `const Limits&` argument per call, or a
// Limits given to a converter value when it is made. There is no process-wide setter, so one
// caller's choice never changes another's. Each refusal has a message of its own that names
// the limit, so it is never mistaken for a syntax error.
//
// Running out of memory is not a limit but takes one path too: pool allocation never throws; a
// failed allocation is a null pointer that each caller turns into its own failure, and readers
// that have no message of their own say kOutOfMemoryMessage.
//
// Thread safety: plain values and constant texts.
#pragma once

#include <cstddef>
#include <cstdint>

#include "sarn/base/Export.h"

namespace sarn {

struct SARN_EXPORT Limits {
  // Nesting depth: how many containers (JSON objects and arrays, nested Dictionary trees and
  // objects) may be open at once; the top-level one is level 1. The readers keep their open
  // containers off the native stack, but writing and comparing a tree recurse once per level,
  // so this bound is what keeps those walks safe for every tree a reader builds: at the default
  // a whole read, write, compare and release fits in a 256 KiB thread stack. A document nested
  // exactly this deep is read; one level deeper is refused with the reader's depth message. A
  // limit below 1 refuses every document.
  static constexpr int kDefaultMaxDepth = 512;

  Limits() : maxDepthM(kDefaultMaxDepth) {}
  explicit Limits(int maxDepth) : maxDepthM(maxDepth) {}

  int maxDepthM;
};

// The name the JSON readers' interface has always used.
typedef Limits JsonLimits;

// Refused nesting depth; %d is the limit in force.
SARN_EXPORT extern const char kJsonDepthLimitFormat[];        // "JSON nesting exceeds the depth limit of %d levels."
SARN_EXPORT extern const char kDictionaryDepthLimitFormat[];  // "Dictionary nesting exceeds the depth limit of %d levels."
// Lazy payloads converted inside one another (each level a conversion that a writer, another
// conversion or a comparison starts) past Limits::kDefaultMaxDepth: the innermost is taken as
// the "error" object with this text.
// The same text when those conversions, each one recursing into the next, have taken this much
// native stack below the outermost one (in optimised builds), whichever comes first: a level can
// hold a whole tree written recursively, so levels alone do not bound the stack.
constexpr size_t kLazyNestingStackBytes = 64 * 1024;
SARN_EXPORT extern const char kLazyDictDepthLimitFormat[];  // "Lazy payload nesting exceeds the depth limit of %d levels."

// The platform arrays under ArrayValue and under one name of a Dictionary hold at most this
// many values; a reader refuses a document that would need more rather than drop values.
constexpr unsigned kMaxValuesPerContainer = 65535;
SARN_EXPORT extern const char kJsonArrayLimitMessage[];        // "JSON array holds more than 65535 elements."
SARN_EXPORT extern const char kJsonRepeatedKeyLimitMessage[];  // "JSON object repeats a key more than 65535 times."
// The object reader records one type per JSON object of a text in a platform array.
SARN_EXPORT extern const char kJsonObjectCountLimitMessage[];  // "JSON text holds more than 65535 objects."

// A frame holding more header lines than that is refused by the frame readers (the writers
// refuse such a message as "Kerno Rpc headers are too large").
SARN_EXPORT extern const char kRpcHeaderLineLimitMessage[];  // "Kerno Rpc frame holds more than 65535 header lines."

// A pool that could not serve an allocation, where the failing operation has no message of its own.
SARN_EXPORT extern const char kOutOfMemoryMessage[];  // "Out of memory."

}  // namespace sarn
