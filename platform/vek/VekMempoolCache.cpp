// The caches of free blocks that threads other than a pool's owner keep per pool.
//
// A cache belongs to one thread and one pool and is on two lists: the thread's (walked when the
// thread ends) and the pool's (walked when the pool is destroyed). Whichever of the two comes
// first spills the cache's blocks back to the pool's slabs under the process-wide lock below,
// so that the other never meets a half-handed-back cache: a pool being destroyed marks the
// cache dead (no pool) and leaves freeing it to its thread; a thread that ends unlinks its
// caches from their pools and frees them. Both are rare; the lock is not on any common path.
#include <new>

#include "vek/VekMempool.h"

struct VekMempool::ThreadCache : VekMempool::Cache {
  uint64_t serialM = 0;
  std::atomic<VekMempool*> pPoolM{nullptr};  // null once the pool is destroyed
  ThreadCache* pNextInThreadM = nullptr;
  ThreadCache* pPrevInPoolM = nullptr;
  ThreadCache* pNextInPoolM = nullptr;

  // Spills and frees a thread's caches when the thread ends.
  static void HandBack(ThreadCache* head);
  void UnlinkFromPool(VekMempool* pool);
};

// The calling thread's last cache and the serial of its pool (0 for none), read on every
// Malloc and Free of a thread that is not the pool's owner.
__thread uint64_t tLastCacheSerialG __attribute__((tls_model("initial-exec"), visibility("hidden")));
__thread VekMempool::Cache* tLastCacheG __attribute__((tls_model("initial-exec"), visibility("hidden")));

namespace {

__thread VekMempool::ThreadCache* tThreadCachesG __attribute__((tls_model("initial-exec")));
// Set when the thread's caches were handed back: later frees of the ending thread (from other
// thread-local destructors) go straight to the slabs.
__thread bool tIsEndingG __attribute__((tls_model("initial-exec")));

VekSpinLock& CachesLock() {
  static VekSpinLock lock("VekMempool caches");
  return lock;
}

// Its destructor runs when the thread ends; it is armed when the thread makes its first cache,
// so threads that never share a pool pay nothing.
struct ThreadCacheReaper {
  bool isArmedM = false;
  ~ThreadCacheReaper() {
    tIsEndingG = true;
    tLastCacheSerialG = 0;
    tLastCacheG = nullptr;
    VekMempool::ThreadCache* head = tThreadCachesG;
    tThreadCachesG = nullptr;
    VekMempool::ThreadCache::HandBack(head);
  }
};
thread_local ThreadCacheReaper tReaperG;

}  // namespace

void VekMempool::ThreadCache::UnlinkFromPool(VekMempool* pool) {
  if (pPrevInPoolM != nullptr) {
    pPrevInPoolM->pNextInPoolM = pNextInPoolM;
  } else {
    pool->pThreadCachesM = pNextInPoolM;
  }
  if (pNextInPoolM != nullptr) pNextInPoolM->pPrevInPoolM = pPrevInPoolM;
}

void VekMempool::ThreadCache::HandBack(ThreadCache* head) {
  while (head != nullptr) {
    ThreadCache* next = head->pNextInThreadM;
    CachesLock().Lock();
    VekMempool* pool = head->pPoolM.load(std::memory_order_relaxed);
    if (pool != nullptr) {
      pool->SpillAll(head);
      pool->FlushPending(head);
      pool->sharedLiveM.fetch_add(head->liveM.load(std::memory_order_relaxed), std::memory_order_relaxed);
      head->UnlinkFromPool(pool);
    }
    CachesLock().Unlock();
    delete head;
    head = next;
  }
}

VekMempool::Cache* VekMempool::FindThreadCache() {
  if (tIsEndingG) return nullptr;
  ThreadCache** link = &tThreadCachesG;
  while (ThreadCache* cache = *link) {
    if (cache->pPoolM.load(std::memory_order_acquire) == nullptr) {
      // Its pool was destroyed, which was the pool's last touch of it.
      *link = cache->pNextInThreadM;
      delete cache;
      continue;
    }
    if (cache->serialM == serialM) {
      tLastCacheSerialG = serialM;
      tLastCacheG = cache;
      return cache;
    }
    link = &cache->pNextInThreadM;
  }
  ThreadCache* cache = new (std::nothrow) ThreadCache();
  if (cache == nullptr) return nullptr;
  tReaperG.isArmedM = true;
  cache->serialM = serialM;
  cache->pPoolM.store(this, std::memory_order_relaxed);
  CachesLock().Lock();
  cache->pNextInPoolM = pThreadCachesM;
  if (pThreadCachesM != nullptr) pThreadCachesM->pPrevInPoolM = cache;
  pThreadCachesM = cache;
  CachesLock().Unlock();
  cache->pNextInThreadM = tThreadCachesG;
  tThreadCachesG = cache;
  tLastCacheSerialG = serialM;
  tLastCacheG = cache;
  return cache;
}

void VekMempool::DetachThreadCaches() {
  CachesLock().Lock();
  for (ThreadCache* cache = pThreadCachesM; cache != nullptr;) {
    ThreadCache* next = cache->pNextInPoolM;
    SpillAll(cache);
    FlushPending(cache);
    sharedLiveM.fetch_add(cache->liveM.load(std::memory_order_relaxed), std::memory_order_relaxed);
    // From here on the cache is its thread's to free.
    cache->pPoolM.store(nullptr, std::memory_order_release);
    cache = next;
  }
  pThreadCachesM = nullptr;
  CachesLock().Unlock();
}

size_t VekMempool::GetUsedBytes() const {
  // The threads' pending bytes are read under the lock that keeps their caches from going away.
  CachesLock().Lock();
  size_t used = ownerUsedM.load(std::memory_order_relaxed) + sharedUsedM.load(std::memory_order_relaxed);
  for (ThreadCache* cache = pThreadCachesM; cache != nullptr; cache = cache->pNextInPoolM) {
    used += cache->pendingBytesM.load(std::memory_order_relaxed);
  }
  CachesLock().Unlock();
  return used;
}

size_t VekMempool::GetLiveBlocks() const {
  // The threads' own counts are read under the lock that keeps their caches from going away.
  CachesLock().Lock();
  size_t live = ownerCacheM.liveM.load(std::memory_order_relaxed) + sharedLiveM.load(std::memory_order_relaxed);
  for (ThreadCache* cache = pThreadCachesM; cache != nullptr; cache = cache->pNextInPoolM) {
    live += cache->liveM.load(std::memory_order_relaxed);
  }
  CachesLock().Unlock();
  return live;
}
