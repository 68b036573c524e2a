#include "vek/VekSpinLock.h"

#include <sched.h>

namespace {
// The processor's spin-wait hint: it saves power and frees the core's shared resources for a
// sibling hyper-thread that may be the holder.
inline void CpuRelax() {
#if defined(__x86_64__) || defined(__i386__)
  __builtin_ia32_pause();
#elif defined(__aarch64__) || defined(__arm__)
  __asm__ __volatile__("yield" ::: "memory");
#else
  std::atomic_signal_fence(std::memory_order_seq_cst);
#endif
}
}  // namespace

void VekSpinLock::LockSlow() {
  int spins = 0;
  do {
    // Wait on a plain load so the cache line stays shared until the holder releases it.
    while (isLockedM.load(std::memory_order_relaxed)) {
      if (spins < 64) {
        ++spins;
        CpuRelax();
      } else {
        sched_yield();
      }
    }
  } while (isLockedM.exchange(true, std::memory_order_acquire));
}
