// VekMempool: a named memory pool. Every allocation of the library names one.
//
// A pool keeps exact accounting of the bytes its callers asked for (GetUsedBytes) and of its
// live blocks, and the highest figure the used bytes reached (GetUsedBytesHighWater).
//
// Small blocks (up to 512 bytes, in size classes of 16 bytes) are carved from slabs of 64 KiB
// that the pool takes from the system, aligned to their size so that a block's slab (and with
// it the pool, the size class and the size asked for) is found from the block's address: small
// blocks carry no header. A slab holds blocks of one class, handed out in address order and
// taken back through the slab's own free list. Each thread keeps a small cache of free blocks
// per pool and class in front of the slabs (bounded; see kCacheBytesPerClass), so that the
// common path of Malloc and Free takes no lock. A slab whose blocks are all free goes back to
// the system, beyond a reserve of kFreeSlabReserve wholly free slabs per pool; every slab goes
// back when the pool is destroyed. "Back to the system" passes through one process-wide reserve
// of 32 slabs (2 MiB) that new pools take from first, so that a program making a pool per
// message does not map and unmap slabs for every message. Larger blocks come from the C library with a 16-byte header
// and grow with its realloc, which moves pages rather than bytes for large blocks.
//
// Builds with AddressSanitizer recycle nothing: a freed small block is poisoned and never
// handed out again, and a slab goes back to the system as soon as it is used up and all its
// blocks are free, so that a use after free inside a pool is caught.
//
// Thread safety: every member may be called from any thread at once (an object may be made on
// one thread and released on another). The thread that constructed the pool counts with plain
// stores and keeps its cache in the pool. Any other thread gets a cache of its own on its first
// call, handed back to the pool when the thread ends or the pool is destroyed; it counts its
// blocks and its bytes in its cache, and moves its bytes to a counter shared by all such
// threads in batches (kSharedBytesBatch either way), so that threads sharing a pool do not pass
// a cache line back and forth on every call. Caches refill from and spill to the slabs in
// batches under a spin lock. Used bytes and live blocks are exact whenever the threads' calls
// are ordered (by a join, a lock, an atomic hand-off). The high water is exact for the creating
// thread's allocations so ordered; the bytes of other threads enter it when a batch moves, so
// it may miss up to kSharedBytesBatch per such thread, and two allocations racing on different
// threads may each miss the other's bytes.
//
// A pool must outlive every block allocated from it; destroying a pool that still has live
// blocks reports them on standard error and, in builds without NDEBUG, asserts (the slabs that
// hold those blocks stay allocated). Destroying it must not race with any other call on it.
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
  // Keeps the first min(old, new) bytes; Realloc(nullptr, n) is Malloc(n). On failure returns
  // null and leaves the block as it was.
  void* Realloc(void* p, size_t nByte);
  // Free(nullptr) does nothing. The block must come from this pool.
  void Free(void* p);
  // Hands the calling thread's cached free blocks back to the slabs, so that wholly free slabs
  // beyond the reserve go back to the system (after a burst, say).
  void Trim();

  // Bytes requested by live blocks (rounding to the size class and headers not counted).
  size_t GetUsedBytes() const;
  size_t GetUsedBytesHighWater() const;
  size_t GetLiveBlocks() const;
  // Slabs the pool holds from the system: in use, in reserve, or used up.
  size_t GetSlabCount() const { return nSlabM.load(std::memory_order_relaxed); }
  const char* GetName() const { return nameM; }

  // The pool a block was allocated from.
  static VekMempool* PoolOf(const void* p);
  // The size the caller asked for when the block was allocated (or last reallocated).
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
  static constexpr size_t kSlabBytes = size_t{1} << 16;
  static constexpr size_t kFreeSlabReserve = 1;
  // What one thread's cache holds at most per class (at least 16 and at most 256 blocks).
  static constexpr size_t kCacheBytesPerClass = 8192;
  static constexpr size_t kSharedBytesBatch = 4096;

  struct FreeNode {
    FreeNode* pNextM;
  };
  // Free blocks of one pool held by one thread, per class, in front of the slabs.
  struct Cache {
    FreeNode* vHeadM[kNumClasses] = {};
    uint32_t vCountM[kNumClasses] = {};
    // Blocks the thread allocated minus those it freed (modulo 2^64), written by it alone.
    std::atomic<size_t> liveM{0};
    // A thread cache's bytes not yet moved to the shared counter (modulo 2^64, under
    // kSharedBytesBatch either way), written by its thread alone.
    std::atomic<size_t> pendingBytesM{0};
  };
  struct Slab;
  struct ThreadCache;

 private:
  bool IsOwnerThread() const;
  bool IsFailingForTest();
  void* MallocLarge(size_t nByte);
  void* ReallocLarge(void* p, size_t nByte);
  void* MallocSmall(size_t nByte);
  FreeNode* TakeOne(size_t c);
  void FreeSmall(Slab* slab, void* p);
  // Adds `nByte` bytes and `nBlock` blocks (both may be "negative", modulo 2^64) to the counts
  // of the calling thread: the owner's, those of the thread's cache, or (null) the shared ones.
  void Count(Cache* cache, size_t nByte, size_t nBlock);
  void CountBlocks(Cache* cache, size_t nBlock);
  // Count, then raise the high water to the sum the counts now give.
  void CountAndRaise(Cache* cache, size_t nByte, size_t nBlock);
  bool CountPending(Cache* cache, size_t nByte);
  void FlushPending(Cache* cache);
  void RaiseHighWater(size_t used);
  // The owner's cache or the calling thread's last cache when it is this pool's, else null.
  Cache* KnownCacheOf();

  // The slabs, under lockM. Refill moves up to `nWant` blocks of class `c` to the cache and
  // returns false when not one could be had; Spill gives `n` of the cache's blocks back.
  bool Refill(Cache* cache, size_t c, uint32_t nWant);
  void Spill(Cache* cache, size_t c, uint32_t n);
  void SpillAll(Cache* cache);
  void ReturnToSlabLocked(FreeNode* node);
  Slab* TakeSlabLocked(size_t c);
  void ReleaseSlabLocked(Slab* slab);
  void LinkLocked(Slab*& list, Slab* slab);
  void UnlinkLocked(Slab*& list, Slab* slab);

  // The calling thread's cache for this pool (VekMempoolCache.cpp): null when none can be had
  // (out of memory, or the thread is ending), and then the caller goes to the slabs directly.
  // A thread remembers its last cache by the pool's serial number, which no later pool reuses.
  Cache* ThreadCacheOf();
  Cache* FindThreadCache();
  void DetachThreadCaches();

  char nameM[64];
  uint64_t serialM;
  const void* pOwnerM;
  std::atomic<long> failCountdownM{-1};

  // The owner thread's side: its cache (with its live blocks) and its bytes, written by it alone
  // (a load and a store, no locked instruction) and read by anyone.
  Cache ownerCacheM;
  std::atomic<size_t> ownerUsedM{0};

  // Everyone else's bytes, and the live blocks of threads without a cache (or whose cache was
  // handed back), on their own cache line so that they do not slow the owner down.
  alignas(64) std::atomic<size_t> sharedUsedM{0};
  std::atomic<size_t> sharedLiveM{0};
  std::atomic<size_t> highWaterM{0};

  // The slabs: per class, those with a free block or room to carve one, and those without.
  alignas(64) VekSpinLock lockM;
  Slab* vRoomyM[kNumClasses] = {};
  Slab* vUsedUpM[kNumClasses] = {};
  Slab* pSpareM = nullptr;  // wholly free slabs in reserve, at most kFreeSlabReserve
  size_t nSpareM = 0;
  std::atomic<size_t> nSlabM{0};
  ThreadCache* pThreadCachesM = nullptr;  // under the process-wide lock of the thread caches
};

// Passed where the platform asks which subsystem uses a pool; recorded nowhere here.
typedef int VekMempoolUser;
