// Small platform services: assertions, the spin lock, the logger, feature switches and time.
#pragma once

#include <atomic>
#include <cstdint>

#include "vek/VekString.h"

// Reports a broken internal invariant ("condition" failed in "file") and aborts. Ordinary
// input never reaches it.
[[noreturn]] void VekAssertFail(const char* condition, const char* file);
#define VekAssert(condition) ((condition) ? (void)0 : VekAssertFail(#condition, __FILE__))

// Identifies the lock that owns a structure in debug builds of the platform; recorded nowhere here.
typedef uint32_t VekLockId;

// A busy-waiting lock for very short critical sections. Not recursive.
class VekSpinLock {
 public:
  // `name` and `rank` describe the lock to the platform's lock checker, which this stand-in lacks.
  explicit VekSpinLock(const char* name = nullptr, int rank = 0) : nameM(name), rankM(rank) {}
  VekSpinLock(const VekSpinLock&) = delete;
  VekSpinLock& operator=(const VekSpinLock&) = delete;
  void Lock();
  void Unlock() { flagM.clear(std::memory_order_release); }
  bool TryLock() { return !flagM.test_and_set(std::memory_order_acquire); }
  const char* GetName() const { return nameM; }
  int GetRank() const { return rankM; }

 private:
  std::atomic_flag flagM = ATOMIC_FLAG_INIT;
  const char* nameM;
  int rankM;
};

class VekSpinLockGuard {
 public:
  explicit VekSpinLockGuard(VekSpinLock& lock) : lockM(lock) { lockM.Lock(); }
  ~VekSpinLockGuard() { lockM.Unlock(); }
  VekSpinLockGuard(const VekSpinLockGuard&) = delete;
  VekSpinLockGuard& operator=(const VekSpinLockGuard&) = delete;

 private:
  VekSpinLock& lockM;
};

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
