// VekMempool: a named memory pool. Every allocation of the library names one.
//
// A pool keeps exact accounting of the bytes its callers asked for (GetUsedBytes) and of its
// live blocks, and the highest figure the used bytes reached (GetUsedBytesHighWater). Small
// blocks (up to 512 bytes) are recycled through per-size-class free lists kept in the pool;
// larger blocks go straight to malloc. Each free list holds at most kMaxCachedBytesPerClass
// bytes; beyond that a freed block goes back to the C library, so a pool never keeps more
// than a bounded amount of memory for reuse. Builds with AddressSanitizer recycle nothing, so
// that a use after free inside a pool is caught.
//
// Thread safety: every member may be called from any thread at once (an object may be made on
// one thread and released on another). The thread that constructed the pool takes a lock-free
// path: its free lists and counters are its own. Other threads share a second set of free
// lists under a spin lock and count with atomic additions; a block freed on another thread
// reaches the owner's lists when the owner runs short. Used bytes and live blocks are exact
// whenever the threads' calls are ordered (by a join, a lock, an atomic hand-off). The high
// water is exact for allocations so ordered; two allocations racing on different threads may
// each miss the other's bytes.
//
// A pool must outlive every block allocated from it; destroying a pool that still has live
// blocks reports them on standard error and, in builds without NDEBUG, asserts. Destroying it
// must not race with any other call on it.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>

#include "vek/VekSpinLock.h"

class VekMempool {
 public:
  explicit VekMempool(const char* name);
  ~VekMempool();
  VekMempool(const VekMempool&) = delete;
  VekMempool& operator=(const VekMempool&) = delete;

  // The process-wide pool, used where no pool is named (VekString from a C string, say).
  static VekMempool* Default();

  // Returns null only when the system is out of memory. Malloc(0) returns a valid block.
  void* Malloc(size_t nByte);
  void* Calloc(size_t nByte);
  void* Calloc(size_t count, size_t size);
  // Keeps the first min(old, new) bytes; Realloc(nullptr, n) is Malloc(n).
  void* Realloc(void* p, size_t nByte);
  // Free(nullptr) does nothing. The block must come from this pool.
  void Free(void* p);

  // Bytes requested by live blocks (headers and rounding not counted).
  size_t GetUsedBytes() const;
  size_t GetUsedBytesHighWater() const;
  size_t GetLiveBlocks() const;
  const char* GetName() const { return nameM; }

  // The pool a block was allocated from (recorded in the block's header).
  static VekMempool* PoolOf(const void* p);
  // The size the caller asked for when the block was allocated.
  static size_t SizeOf(const void* p);

  // Test hook: after `n` more allocations succeed (Malloc, Calloc, Realloc), the next one fails
  // and returns null, once; the hook is then off again. A negative `n` switches it off. With a
  // large `n`, what GetFailCountdown lost over a run is the number of allocations the run made,
  // so a test can fail each of them in turn.
  void FailAllocationAfter(long n) { failCountdownM.store(n, std::memory_order_relaxed); }
  long GetFailCountdown() const { return failCountdownM.load(std::memory_order_relaxed); }

  static constexpr size_t kMaxSmallBlock = 512;
  static constexpr size_t kClassGranularity = 16;
  static constexpr size_t kNumClasses = kMaxSmallBlock / kClassGranularity;
  static constexpr size_t kMaxCachedBytesPerClass = 1 << 20;

 private:
  struct FreeNode {
    FreeNode* pNextM;
  };
  bool IsOwnerThread() const;
  bool IsFailingForTest();
  void* MallocSmall(size_t nByte);
  void FreeSmall(void* p, size_t nByte);
  // Adds `nByte` bytes and `nBlock` blocks (both may be "negative", modulo 2^64) to the count
  // of the calling thread's side.
  void Count(bool isOwner, size_t nByte, size_t nBlock);
  void RaiseHighWater();

  char nameM[64];
  const void* pOwnerM;
  std::atomic<long> failCountdownM{-1};

  // The owner thread's side: lists touched by it alone; counters written by it alone (a load
  // and a store, no locked instruction) and read by anyone.
  FreeNode* vOwnerFreeM[kNumClasses] = {};
  uint32_t vOwnerFreeCountM[kNumClasses] = {};
  std::atomic<size_t> ownerUsedM{0};
  std::atomic<size_t> ownerLiveM{0};

  // Everyone else's side, on its own cache lines so that it does not slow the owner down.
  alignas(64) mutable VekSpinLock lockM;
  std::atomic<size_t> sharedFreeBlocksM{0};  // blocks on the shared lists: lets the owner skip the lock
  FreeNode* vSharedFreeM[kNumClasses] = {};
  uint32_t vSharedFreeCountM[kNumClasses] = {};
  alignas(64) std::atomic<size_t> sharedUsedM{0};
  std::atomic<size_t> sharedLiveM{0};
  std::atomic<size_t> highWaterM{0};
};

// Passed where the platform asks which subsystem uses a pool; recorded nowhere here.
typedef int VekMempoolUser;
