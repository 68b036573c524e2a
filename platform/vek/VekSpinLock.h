// VekSpinLock: a busy-waiting lock for very short critical sections (a few loads and stores),
// and VekSpinLockGuard, which holds one for a scope.
//
// Not recursive. A waiter spins with the processor's pause hint and, after a short while,
// gives its time slice away, so a holder that was preempted is not starved by its waiters on a
// machine with few cores. Any thread may take and release it.
#pragma once

#include <atomic>
#include <cstdint>

// Identifies the lock that owns a structure in debug builds of the platform; recorded nowhere here.
typedef uint32_t VekLockId;

class VekSpinLock {
 public:
  // `name` and `rank` describe the lock to the platform's lock checker, which this stand-in lacks.
  explicit VekSpinLock(const char* name = nullptr, int rank = 0) : nameM(name), rankM(rank) {}
  VekSpinLock(const VekSpinLock&) = delete;
  VekSpinLock& operator=(const VekSpinLock&) = delete;
  void Lock() {
    if (!isLockedM.exchange(true, std::memory_order_acquire)) return;
    LockSlow();
  }
  void Unlock() { isLockedM.store(false, std::memory_order_release); }
  bool TryLock() {
    return !isLockedM.load(std::memory_order_relaxed) && !isLockedM.exchange(true, std::memory_order_acquire);
  }
  const char* GetName() const { return nameM; }
  int GetRank() const { return rankM; }

 private:
  void LockSlow();
  std::atomic<bool> isLockedM{false};
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
