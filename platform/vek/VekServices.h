// Small platform services: assertions, the spin lock (VekSpinLock.h), the logger, feature
// switches and time. All of them may be used from any thread.
#pragma once

#include <atomic>
#include <cstdint>

#include "vek/VekSpinLock.h"
#include "vek/VekString.h"

// Reports a broken internal invariant ("condition" failed in "file") and aborts. Ordinary
// input never reaches it.
[[noreturn]] void VekAssertFail(const char* condition, const char* file);
#define VekAssert(condition) ((condition) ? (void)0 : VekAssertFail(#condition, __FILE__))

// The platform logger. Each call formats one line; with no sink set the line goes to
// standard error as "<tag>: <line>". A sink receives every line instead (thread-safe: the
// sink is called under a lock, one line at a time).
class VekLogger {
 public:
  typedef void (*Sink)(int facility, int priority, const char* tag, const char* line);
  static void Log(int facility, int priority, const char* tag, const char* format, ...)
      __attribute__((format(printf, 4, 5)));
  // Returns the previous sink; null restores standard error.
  static Sink SetSink(Sink sink);
};

// Numbered feature switches, all off until set. Feature 548 is also switched on when the
// environment variable VEK_FEATURE_548 is "1" at the first query.
class VekFeatures {
 public:
  static bool FEnabled(int id);
  static void SetEnabled(int id, bool isEnabled);
  static constexpr int kMaxFeature = 4096;
};

// A time interval in nanoseconds.
class VekTime {
 public:
  VekTime() : nanosecondsM(0) {}
  explicit VekTime(int64_t nanoseconds) : nanosecondsM(nanoseconds) {}
  int64_t GetNanoseconds() const { return nanosecondsM; }
  VekTime operator-(const VekTime& other) const { return VekTime(nanosecondsM - other.nanosecondsM); }
  // The interval as text with a unit: "850ns", "12.345us", "3.200ms", "1.500000s".
  VekString DebugStringAsInterval() const;

 private:
  int64_t nanosecondsM;
};

// Reads the monotonic clock.
class VekMonotonicTime {
 public:
  static VekTime Now();
};
