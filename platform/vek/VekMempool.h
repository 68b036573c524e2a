// VekMempool: a named memory pool. Every allocation of the library names one.
//
// A pool keeps exact accounting of the bytes its callers asked for (GetUsedBytes) and the
// highest that figure reached (GetUsedBytesHighWater). Small blocks (up to 512 bytes) are
// recycled through per-size-class free lists kept in the pool, so allocating and freeing a
// small block costs one uncontended lock and a list push or pop; larger blocks go to malloc.
// The free lists hold at most kMaxCachedBytesPerClass bytes per class; beyond that a freed
// block goes back to the C library, so a pool never keeps more than a bounded amount of
// memory for reuse.
//
// Thread safety: every member may be called from any thread at once (an object may be made on
// one thread and released on another). A pool must outlive every block allocated from it;
// destroying a pool that still has live blocks reports them on standard error and, in builds
// without NDEBUG, asserts.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>

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

  static constexpr size_t kMaxSmallBlock = 512;
  static constexpr size_t kClassGranularity = 16;
  static constexpr size_t kNumClasses = kMaxSmallBlock / kClassGranularity;
  static constexpr size_t kMaxCachedBytesPerClass = 1 << 20;

 private:
  struct FreeNode {
    FreeNode* pNextM;
  };
  void Lock() const;
  void Unlock() const;

  char nameM[64];
  mutable std::atomic_flag lockM = ATOMIC_FLAG_INIT;
  size_t usedBytesM = 0;
  size_t highWaterM = 0;
  size_t liveBlocksM = 0;
  FreeNode* vFreeM[kNumClasses] = {};
  size_t vFreeCountM[kNumClasses] = {};
};

// Passed where the platform asks which subsystem uses a pool; recorded nowhere here.
typedef int VekMempoolUser;
