#include "vek/VekMempool.h"

#include <cassert>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <initializer_list>
#include <new>

#if defined(__SANITIZE_ADDRESS__)
#define VEK_MEMPOOL_ASAN 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define VEK_MEMPOOL_ASAN 1
#endif
#endif
#ifdef VEK_MEMPOOL_ASAN
#include <sanitizer/asan_interface.h>
#endif

namespace {

// Under AddressSanitizer nothing is recycled: freed small blocks stay poisoned until their
// slab goes back to the C library, whose own quarantine then takes over.
#ifdef VEK_MEMPOOL_ASAN
constexpr bool kIsRecyclingG = false;
inline void Poison(const void* p, size_t n) { __asan_poison_memory_region(p, n); }
inline void Unpoison(const void* p, size_t n) { __asan_unpoison_memory_region(p, n); }
#else
constexpr bool kIsRecyclingG = true;
inline void Poison(const void*, size_t) {}
inline void Unpoison(const void*, size_t) {}
#endif
constexpr size_t kSpareLimitG = kIsRecyclingG ? VekMempool::kFreeSlabReserve : 0;

// Slabs that pools gave back, kept for the next pool to take (at most 32, 2 MiB). A slab is
// 64 KiB on a 64 KiB boundary, which the C library serves from a fresh mapping, so a program
// that makes a pool per message would otherwise map and unmap its slabs for every message. The
// slabs stay marked in the slab map while they wait here.
constexpr size_t kSharedSlabLimitG = kIsRecyclingG ? 32 : 0;
VekSpinLock sharedSlabLockG("VekMempool shared slabs", 1);
void* vSharedSlabG[kSharedSlabLimitG > 0 ? kSharedSlabLimitG : 1];
size_t nSharedSlabG = 0;

void* TakeSharedSlab() {
  if (kSharedSlabLimitG == 0) return nullptr;
  VekSpinLockGuard guard(sharedSlabLockG);
  return nSharedSlabG > 0 ? vSharedSlabG[--nSharedSlabG] : nullptr;
}

bool KeepSharedSlab(void* slab) {
  if (kSharedSlabLimitG == 0) return false;
  VekSpinLockGuard guard(sharedSlabLockG);
  if (nSharedSlabG == kSharedSlabLimitG) return false;
  vSharedSlabG[nSharedSlabG++] = slab;
  return true;
}

// A large block starts with this header so that its payload keeps malloc's 16-byte alignment.
struct LargeHeader {
  size_t nByteM;
  VekMempool* pPoolM;
};
static_assert(sizeof(LargeHeader) == 16, "large block header keeps 16-byte alignment");

inline LargeHeader* HeaderOf(const void* p) {
  return reinterpret_cast<LargeHeader*>(const_cast<char*>(static_cast<const char*>(p)) - sizeof(LargeHeader));
}

inline size_t ClassOf(size_t nByte) {
  // Class c serves payloads of (c * 16, (c + 1) * 16] bytes; 0 bytes uses class 0.
  return nByte == 0 ? 0 : (nByte - 1) / VekMempool::kClassGranularity;
}

// Where the blocks of a class lie in a slab: the 64-byte slab header, then one byte for each 16
// bytes of the slab (the size class minus the size asked for, in the byte of the block's first
// 16), then the blocks. The byte of the block at offset o is at offset o / 16, which is past the
// header for every block, so finding it takes a shift and no division by the block size.
constexpr uint32_t kSlabHeaderBytes = 64;
constexpr uint32_t kFirstBlockOffset = kSlabHeaderBytes + VekMempool::kSlabBytes / VekMempool::kClassGranularity;

struct ClassLayout {
  uint32_t blockBytesM;
  uint32_t endOffsetM;   // one past the last whole block
  uint32_t cacheLimitM;  // what a cache holds of the class before it spills half back to the slabs
};

constexpr ClassLayout MakeLayout(uint32_t c) {
  uint32_t blockBytes = (c + 1) * VekMempool::kClassGranularity;
  uint32_t n = (VekMempool::kSlabBytes - kFirstBlockOffset) / blockBytes;
  uint32_t cacheLimit = static_cast<uint32_t>(VekMempool::kCacheBytesPerClass / blockBytes);
  cacheLimit = cacheLimit < 16 ? 16 : cacheLimit > 256 ? 256 : cacheLimit;
  return ClassLayout{blockBytes, kFirstBlockOffset + n * blockBytes, cacheLimit};
}

struct LayoutTable {
  ClassLayout vLayoutM[VekMempool::kNumClasses];
};

constexpr LayoutTable MakeLayoutTable() {
  LayoutTable table{};
  for (uint32_t c = 0; c < VekMempool::kNumClasses; ++c) table.vLayoutM[c] = MakeLayout(c);
  return table;
}

constexpr LayoutTable kLayoutG = MakeLayoutTable();
static_assert(kFirstBlockOffset / VekMempool::kClassGranularity >= kSlabHeaderBytes, "size bytes follow the header");

inline uint32_t CacheLimitOf(size_t c) { return kLayoutG.vLayoutM[c].cacheLimitM; }

// Which 64 KiB stretches of the address space are slabs: one bit per stretch, in leaves of
// 4 GiB made on first use and never freed. It tells a small block (in a slab, no header) from
// a large one (with a header) before anything at a computed address is read.
constexpr unsigned kSlabShiftG = 16;
constexpr size_t kLeafWords = (size_t{1} << (32 - kSlabShiftG)) / 64;
std::atomic<std::atomic<uint64_t>*> vSlabMapG[size_t{1} << 16];

inline bool IsSlabAddress(const void* p) {
  uintptr_t address = reinterpret_cast<uintptr_t>(p);
  if ((address >> 48) != 0) return false;
  std::atomic<uint64_t>* leaf = vSlabMapG[address >> 32].load(std::memory_order_acquire);
  if (leaf == nullptr) return false;
  size_t bit = (address >> kSlabShiftG) & ((size_t{1} << (32 - kSlabShiftG)) - 1);
  return ((leaf[bit / 64].load(std::memory_order_relaxed) >> (bit % 64)) & 1) != 0;
}

// False when the slab cannot be recorded (an address the map does not cover, or no memory).
bool MarkSlab(const void* slab, bool isSlab) {
  uintptr_t address = reinterpret_cast<uintptr_t>(slab);
  if ((address >> 48) != 0) return false;
  std::atomic<std::atomic<uint64_t>*>& root = vSlabMapG[address >> 32];
  std::atomic<uint64_t>* leaf = root.load(std::memory_order_acquire);
  if (leaf == nullptr) {
    std::atomic<uint64_t>* fresh = new (std::nothrow) std::atomic<uint64_t>[kLeafWords]();
    if (fresh == nullptr) return false;
    if (root.compare_exchange_strong(leaf, fresh, std::memory_order_acq_rel)) {
      leaf = fresh;
    } else {
      delete[] fresh;
    }
  }
  size_t bit = (address >> kSlabShiftG) & ((size_t{1} << (32 - kSlabShiftG)) - 1);
  uint64_t mask = uint64_t{1} << (bit % 64);
  if (isSlab) {
    leaf[bit / 64].fetch_or(mask, std::memory_order_relaxed);
  } else {
    leaf[bit / 64].fetch_and(~mask, std::memory_order_relaxed);
  }
  return true;
}

}  // namespace

// The header at the start of every slab. Its fields change under the pool's lock only; the
// per-block size bytes after it belong to whoever holds the block.
struct VekMempool::Slab {
  VekMempool* pPoolM;
  Slab* pPrevM;
  Slab* pNextM;
  FreeNode* pFreeM;       // blocks given back, most recent first
  uint32_t classM;
  uint32_t nOutM;         // blocks carved and not on pFreeM: in use or in a cache
  uint32_t carveOffsetM;  // first byte not carved yet
  bool isUsedUpM;         // on vUsedUpM: no free block and nothing left to carve
};
static_assert(sizeof(VekMempool::Slab) <= kSlabHeaderBytes, "slab header fits its room");

namespace {

inline VekMempool::Slab* SlabOf(const void* p) {
  return reinterpret_cast<VekMempool::Slab*>(reinterpret_cast<uintptr_t>(p) & ~(VekMempool::kSlabBytes - 1));
}

// The size byte of the block at `p`, in a slab of class `c`.
inline uint8_t& SlackOf(VekMempool::Slab* slab, size_t c, const void* p) {
  uintptr_t offset = reinterpret_cast<uintptr_t>(p) - reinterpret_cast<uintptr_t>(slab);
  assert(offset >= kFirstBlockOffset && offset < kLayoutG.vLayoutM[c].endOffsetM &&
         (offset - kFirstBlockOffset) % kLayoutG.vLayoutM[c].blockBytesM == 0 && "address inside a block");
  (void)c;
  return reinterpret_cast<uint8_t*>(slab)[offset / VekMempool::kClassGranularity];
}

inline size_t SmallSizeOf(VekMempool::Slab* slab, size_t c, const void* p) {
  return (c + 1) * VekMempool::kClassGranularity - SlackOf(slab, c, p);
}

}  // namespace

// The address of a thread-local byte identifies the calling thread at the cost of one load
// (the initial-exec model keeps it off the slow general TLS path in this shared library).
// When a thread ends and a new one reuses its storage, the new one becomes the owner of the
// old one's pools; the old one can no longer race with it.
namespace {
thread_local char tThreadMarkerG __attribute__((tls_model("initial-exec")));
}  // namespace

namespace {
std::atomic<uint64_t> nextSerialG{1};
}  // namespace

VekMempool::VekMempool(const char* name)
    : serialM(nextSerialG.fetch_add(1, std::memory_order_relaxed)), pOwnerM(&tThreadMarkerG) {
  std::snprintf(nameM, sizeof nameM, "%s", name != nullptr ? name : "");
}

VekMempool::~VekMempool() {
  size_t live = GetLiveBlocks();
  if (live != 0) {
    std::fprintf(stderr, "VekMempool '%s' destroyed with %zu live blocks (%zu bytes)\n", nameM, live,
                 GetUsedBytes());
    assert(live == 0 && "pool destroyed with live allocations");
  }
  DetachThreadCaches();
  SpillAll(&ownerCacheM);
  // Every cached block is back in its slab, so a slab with blocks out holds live (leaked)
  // blocks: it stays allocated, as those blocks would have.
  lockM.Lock();
  while (pSpareM != nullptr) {
    Slab* slab = pSpareM;
    pSpareM = slab->pNextM;
    ReleaseSlabLocked(slab);
  }
  for (size_t c = 0; c < kNumClasses; ++c) {
    for (Slab** list : {&vRoomyM[c], &vUsedUpM[c]}) {
      for (Slab* slab = *list; slab != nullptr;) {
        Slab* next = slab->pNextM;
        if (slab->nOutM == 0) ReleaseSlabLocked(slab);
        slab = next;
      }
    }
  }
  lockM.Unlock();
}

VekMempool* VekMempool::Default() {
  // Never destroyed: objects in the default pool may be released by static destructors.
  static VekMempool* pool = new VekMempool("default");
  return pool;
}

inline bool VekMempool::IsOwnerThread() const { return pOwnerM == &tThreadMarkerG; }

inline void VekMempool::CountBlocks(Cache* cache, size_t nBlock) {
  if (cache != nullptr) {
    // Only the cache's thread writes its count, so a load and a store suffice.
    cache->liveM.store(cache->liveM.load(std::memory_order_relaxed) + nBlock, std::memory_order_relaxed);
  } else {
    sharedLiveM.fetch_add(nBlock, std::memory_order_relaxed);
  }
}

// A thread cache's bytes: added to its pending count, moved to the shared counter once the
// pending count reaches kSharedBytesBatch either way. True when it moved.
inline bool VekMempool::CountPending(Cache* cache, size_t nByte) {
  size_t pending = cache->pendingBytesM.load(std::memory_order_relaxed) + nByte;
  if (pending + kSharedBytesBatch < 2 * kSharedBytesBatch) {  // within (-batch, batch), modulo 2^64
    cache->pendingBytesM.store(pending, std::memory_order_relaxed);
    return false;
  }
  sharedUsedM.fetch_add(pending, std::memory_order_relaxed);
  cache->pendingBytesM.store(0, std::memory_order_relaxed);
  return true;
}

// Moves all of a cache's pending bytes (a cache handed back, or a pool going away).
void VekMempool::FlushPending(Cache* cache) {
  sharedUsedM.fetch_add(cache->pendingBytesM.load(std::memory_order_relaxed), std::memory_order_relaxed);
  cache->pendingBytesM.store(0, std::memory_order_relaxed);
}

inline void VekMempool::Count(Cache* cache, size_t nByte, size_t nBlock) {
  // Only the owner writes its bytes (a load and a store suffice); the other threads' caches
  // gather theirs and move them in batches; blocks taken without a cache count at once.
  if (cache == &ownerCacheM) {
    ownerUsedM.store(ownerUsedM.load(std::memory_order_relaxed) + nByte, std::memory_order_relaxed);
  } else if (cache != nullptr) {
    CountPending(cache, nByte);
  } else {
    sharedUsedM.fetch_add(nByte, std::memory_order_relaxed);
  }
  CountBlocks(cache, nBlock);
}

inline void VekMempool::CountAndRaise(Cache* cache, size_t nByte, size_t nBlock) {
  CountBlocks(cache, nBlock);
  if (cache == &ownerCacheM) {
    size_t mine = ownerUsedM.load(std::memory_order_relaxed) + nByte;
    ownerUsedM.store(mine, std::memory_order_relaxed);
    RaiseHighWater(mine + sharedUsedM.load(std::memory_order_relaxed));
  } else if (cache != nullptr) {
    if (CountPending(cache, nByte)) {
      RaiseHighWater(sharedUsedM.load(std::memory_order_relaxed) + ownerUsedM.load(std::memory_order_relaxed));
    }
  } else {
    RaiseHighWater(sharedUsedM.fetch_add(nByte, std::memory_order_relaxed) + nByte +
                   ownerUsedM.load(std::memory_order_relaxed));
  }
}

inline void VekMempool::RaiseHighWater(size_t used) {
  // A sum that looks negative mixes a free seen on one side with an allocation not yet seen on
  // the other; it is never a peak.
  if (used > SIZE_MAX / 2) return;
  size_t high = highWaterM.load(std::memory_order_relaxed);
  while (used > high && !highWaterM.compare_exchange_weak(high, used, std::memory_order_relaxed)) {
  }
}

// ---- slabs (under lockM) ----

void VekMempool::LinkLocked(Slab*& list, Slab* slab) {
  slab->pPrevM = nullptr;
  slab->pNextM = list;
  if (list != nullptr) list->pPrevM = slab;
  list = slab;
}

void VekMempool::UnlinkLocked(Slab*& list, Slab* slab) {
  if (slab->pPrevM != nullptr) {
    slab->pPrevM->pNextM = slab->pNextM;
  } else {
    list = slab->pNextM;
  }
  if (slab->pNextM != nullptr) slab->pNextM->pPrevM = slab->pPrevM;
}

VekMempool::Slab* VekMempool::TakeSlabLocked(size_t c) {
  Slab* slab = pSpareM;
  if (slab != nullptr) {
    pSpareM = slab->pNextM;
    --nSpareM;
  } else {
    void* memory = TakeSharedSlab();
    if (memory == nullptr) {
      memory = std::aligned_alloc(kSlabBytes, kSlabBytes);
      if (memory == nullptr) return nullptr;
      if (!MarkSlab(memory, true)) {
        std::free(memory);
        return nullptr;
      }
    }
    slab = new (memory) Slab;
    nSlabM.fetch_add(1, std::memory_order_relaxed);
  }
  slab->pPoolM = this;
  slab->pFreeM = nullptr;
  slab->classM = static_cast<uint32_t>(c);
  slab->nOutM = 0;
  slab->carveOffsetM = kFirstBlockOffset;
  slab->isUsedUpM = false;
  Poison(reinterpret_cast<char*>(slab) + kFirstBlockOffset, kSlabBytes - kFirstBlockOffset);
  LinkLocked(vRoomyM[c], slab);
  return slab;
}

void VekMempool::ReleaseSlabLocked(Slab* slab) {
  nSlabM.fetch_sub(1, std::memory_order_relaxed);
  if (KeepSharedSlab(slab)) return;
  MarkSlab(slab, false);
  Unpoison(slab, kSlabBytes);
  std::free(slab);
}

void VekMempool::ReturnToSlabLocked(FreeNode* node) {
  Slab* slab = SlabOf(node);
  size_t c = slab->classM;
  if (kIsRecyclingG) {
    node->pNextM = slab->pFreeM;
    slab->pFreeM = node;
    if (slab->isUsedUpM) {
      UnlinkLocked(vUsedUpM[c], slab);
      LinkLocked(vRoomyM[c], slab);
      slab->isUsedUpM = false;
    }
  }
  if (--slab->nOutM != 0) return;
  // Without recycling, a slab still being carved stays until it is used up.
  if (!kIsRecyclingG && !slab->isUsedUpM) return;
  UnlinkLocked(slab->isUsedUpM ? vUsedUpM[c] : vRoomyM[c], slab);
  if (nSpareM < kSpareLimitG) {
    slab->pNextM = pSpareM;
    pSpareM = slab;
    ++nSpareM;
  } else {
    ReleaseSlabLocked(slab);
  }
}

bool VekMempool::Refill(Cache* cache, size_t c, uint32_t nWant) {
  const ClassLayout& layout = kLayoutG.vLayoutM[c];
  // The cache's list of the class is empty; the batch is appended to it in the order taken:
  // blocks given back first (they are warm), then fresh ones in address order.
  FreeNode* head = nullptr;
  FreeNode** pTail = &head;
  uint32_t got = 0;
  lockM.Lock();
  while (got < nWant) {
    Slab* slab = vRoomyM[c];
    if (slab == nullptr && (slab = TakeSlabLocked(c)) == nullptr) break;
    while (got < nWant && slab->pFreeM != nullptr) {
      FreeNode* node = slab->pFreeM;
      slab->pFreeM = node->pNextM;
      *pTail = node;
      pTail = &node->pNextM;
      ++slab->nOutM;
      ++got;
    }
    uint32_t room = (layout.endOffsetM - slab->carveOffsetM) / layout.blockBytesM;
    uint32_t k = room < nWant - got ? room : nWant - got;
    char* next = reinterpret_cast<char*>(slab) + slab->carveOffsetM;
    for (uint32_t i = 0; i < k; ++i, next += layout.blockBytesM) {
      FreeNode* node = reinterpret_cast<FreeNode*>(next);
      Unpoison(node, sizeof(FreeNode));
      *pTail = node;
      pTail = &node->pNextM;
    }
    slab->carveOffsetM += k * layout.blockBytesM;
    slab->nOutM += k;
    got += k;
    if (slab->pFreeM == nullptr && slab->carveOffsetM == layout.endOffsetM) {
      UnlinkLocked(vRoomyM[c], slab);
      LinkLocked(vUsedUpM[c], slab);
      slab->isUsedUpM = true;
    }
  }
  lockM.Unlock();
  *pTail = nullptr;
  cache->vHeadM[c] = head;
  cache->vCountM[c] += got;
  return got != 0;
}

void VekMempool::Spill(Cache* cache, size_t c, uint32_t n) {
  FreeNode* node = cache->vHeadM[c];
  cache->vCountM[c] -= n;
  lockM.Lock();
  for (; n != 0; --n) {
    FreeNode* next = node->pNextM;
    ReturnToSlabLocked(node);
    node = next;
  }
  lockM.Unlock();
  cache->vHeadM[c] = node;
}

void VekMempool::SpillAll(Cache* cache) {
  for (size_t c = 0; c < kNumClasses; ++c) {
    if (cache->vCountM[c] != 0) Spill(cache, c, cache->vCountM[c]);
  }
}

// ---- allocation ----

// Without a cache, a single block comes straight from the slabs.
__attribute__((noinline)) VekMempool::FreeNode* VekMempool::TakeOne(size_t c) {
  Cache one;
  return Refill(&one, c, 1) ? one.vHeadM[c] : nullptr;
}

// The calling thread's last cache (VekMempoolCache.cpp); the serial of its pool, 0 for none.
extern __thread uint64_t tLastCacheSerialG __attribute__((tls_model("initial-exec"), visibility("hidden")));
extern __thread VekMempool::Cache* tLastCacheG __attribute__((tls_model("initial-exec"), visibility("hidden")));

inline VekMempool::Cache* VekMempool::ThreadCacheOf() {
  return tLastCacheSerialG == serialM ? tLastCacheG : FindThreadCache();
}

inline VekMempool::Cache* VekMempool::KnownCacheOf() {
  if (IsOwnerThread()) return &ownerCacheM;
  return tLastCacheSerialG == serialM ? tLastCacheG : nullptr;
}

void* VekMempool::MallocSmall(size_t nByte) {
  size_t c = ClassOf(nByte);
  Cache* cache = !kIsRecyclingG ? nullptr : IsOwnerThread() ? &ownerCacheM : ThreadCacheOf();
  FreeNode* node;
  if (cache != nullptr) {
    if (cache->vHeadM[c] == nullptr && !Refill(cache, c, CacheLimitOf(c) / 2)) return nullptr;
    node = cache->vHeadM[c];
    cache->vHeadM[c] = node->pNextM;
    --cache->vCountM[c];
  } else {
    node = TakeOne(c);
    if (node == nullptr) return nullptr;
  }
  Slab* slab = SlabOf(node);
  SlackOf(slab, c, node) = static_cast<uint8_t>(kLayoutG.vLayoutM[c].blockBytesM - nByte);
  Poison(node, kLayoutG.vLayoutM[c].blockBytesM);
  Unpoison(node, nByte);
  CountAndRaise(cache, nByte, 1);
  return node;
}

void VekMempool::FreeSmall(Slab* slab, void* p) {
  assert(slab->pPoolM == this && "block freed to a pool that did not allocate it");
  size_t c = slab->classM;
  Cache* cache = !kIsRecyclingG ? nullptr : IsOwnerThread() ? &ownerCacheM : ThreadCacheOf();
  Count(cache, 0 - SmallSizeOf(slab, c, p), 0 - size_t{1});
  Poison(p, kLayoutG.vLayoutM[c].blockBytesM);
  FreeNode* node = static_cast<FreeNode*>(p);
  if (cache == nullptr) {
    lockM.Lock();
    ReturnToSlabLocked(node);
    lockM.Unlock();
    return;
  }
  node->pNextM = cache->vHeadM[c];
  cache->vHeadM[c] = node;
  if (++cache->vCountM[c] >= CacheLimitOf(c)) Spill(cache, c, CacheLimitOf(c) / 2);
}

void* VekMempool::MallocLarge(size_t nByte) {
  if (nByte > SIZE_MAX - sizeof(LargeHeader)) return nullptr;
  LargeHeader* header = static_cast<LargeHeader*>(std::malloc(sizeof(LargeHeader) + nByte));
  if (header == nullptr) return nullptr;
  header->nByteM = nByte;
  header->pPoolM = this;
  CountAndRaise(IsOwnerThread() ? &ownerCacheM : nullptr, nByte, 1);
  return header + 1;
}

void* VekMempool::ReallocLarge(void* p, size_t nByte) {
  if (nByte > SIZE_MAX - sizeof(LargeHeader)) return nullptr;
  size_t old = HeaderOf(p)->nByteM;
  // The C library grows a large block in place, or moves its pages, instead of copying.
  LargeHeader* header = static_cast<LargeHeader*>(std::realloc(HeaderOf(p), sizeof(LargeHeader) + nByte));
  if (header == nullptr) return nullptr;
  header->nByteM = nByte;
  if (nByte > old) {
    CountAndRaise(IsOwnerThread() ? &ownerCacheM : nullptr, nByte - old, 0);
  } else {
    Count(IsOwnerThread() ? &ownerCacheM : nullptr, nByte - old, 0);
  }
  return header + 1;
}

bool VekMempool::IsFailingForTest() {
  long n = failCountdownM.load(std::memory_order_relaxed);
  while (n >= 0 && !failCountdownM.compare_exchange_weak(n, n - 1, std::memory_order_relaxed)) {
  }
  return n == 0;
}

void* VekMempool::Malloc(size_t nByte) {
  if (failCountdownM.load(std::memory_order_relaxed) >= 0 && IsFailingForTest()) return nullptr;
  if (nByte > kMaxSmallBlock) return MallocLarge(nByte);
  // The common case (a block in the thread's cache), kept free of calls so that it needs no
  // saved registers; everything else is MallocSmall's.
  size_t c = ClassOf(nByte);
  Cache* cache = KnownCacheOf();
  FreeNode* node;
  if (!kIsRecyclingG || cache == nullptr || (node = cache->vHeadM[c]) == nullptr) return MallocSmall(nByte);
  cache->vHeadM[c] = node->pNextM;
  --cache->vCountM[c];
  SlackOf(SlabOf(node), c, node) = static_cast<uint8_t>(kLayoutG.vLayoutM[c].blockBytesM - nByte);
  CountAndRaise(cache, nByte, 1);
  return node;
}

void* VekMempool::Calloc(size_t nByte) {
  void* p = Malloc(nByte);
  if (p != nullptr) std::memset(p, 0, nByte);
  return p;
}

void* VekMempool::Calloc(size_t count, size_t size) {
  if (size != 0 && count > SIZE_MAX / size) return nullptr;
  return Calloc(count * size);
}

void* VekMempool::Realloc(void* p, size_t nByte) {
  if (p == nullptr) return Malloc(nByte);
  if (failCountdownM.load(std::memory_order_relaxed) >= 0 && IsFailingForTest()) return nullptr;
  bool isSmall = IsSlabAddress(p);
  if (!isSmall && nByte > kMaxSmallBlock) return ReallocLarge(p, nByte);
  size_t old = SizeOf(p);
  if (isSmall && nByte <= kMaxSmallBlock && ClassOf(nByte) == SlabOf(p)->classM) {
    // Stay in place while the block's size class still fits.
    Slab* slab = SlabOf(p);
    SlackOf(slab, slab->classM, p) = static_cast<uint8_t>(kLayoutG.vLayoutM[slab->classM].blockBytesM - nByte);
    Poison(p, kLayoutG.vLayoutM[slab->classM].blockBytesM);
    Unpoison(p, nByte);
    if (nByte > old) {
      CountAndRaise(IsOwnerThread() ? &ownerCacheM : nullptr, nByte - old, 0);
    } else {
      Count(IsOwnerThread() ? &ownerCacheM : nullptr, nByte - old, 0);
    }
    return p;
  }
  void* q = Malloc(nByte);
  if (q == nullptr) return nullptr;
  std::memcpy(q, p, old < nByte ? old : nByte);
  Free(p);
  return q;
}

void VekMempool::Free(void* p) {
  if (p == nullptr) return;
  if (IsSlabAddress(p)) {
    Slab* slab = SlabOf(p);
    size_t c = slab->classM;
    FreeNode* node = static_cast<FreeNode*>(p);
    Cache* cache = KnownCacheOf();
    if (!kIsRecyclingG || cache == nullptr || cache->vCountM[c] + 1 >= CacheLimitOf(c)) {
      FreeSmall(slab, p);
      return;
    }
    // The common case, as in Malloc.
    assert(slab->pPoolM == this && "block freed to a pool that did not allocate it");
    Count(cache, 0 - SmallSizeOf(slab, c, p), 0 - size_t{1});
    node->pNextM = cache->vHeadM[c];
    cache->vHeadM[c] = node;
    ++cache->vCountM[c];
    return;
  }
  LargeHeader* header = HeaderOf(p);
  assert(header->pPoolM == this && "block freed to a pool that did not allocate it");
  Count(IsOwnerThread() ? &ownerCacheM : nullptr, 0 - header->nByteM, 0 - size_t{1});
  std::free(header);
}

void VekMempool::Trim() {
  Cache* cache = !kIsRecyclingG ? nullptr : IsOwnerThread() ? &ownerCacheM : ThreadCacheOf();
  if (cache != nullptr) SpillAll(cache);
}

size_t VekMempool::GetUsedBytesHighWater() const { return highWaterM.load(std::memory_order_relaxed); }


VekMempool* VekMempool::PoolOf(const void* p) {
  if (p == nullptr) return nullptr;
  return IsSlabAddress(p) ? SlabOf(p)->pPoolM : HeaderOf(p)->pPoolM;
}

size_t VekMempool::SizeOf(const void* p) {
  if (p == nullptr) return 0;
  return IsSlabAddress(p) ? SmallSizeOf(SlabOf(p), SlabOf(p)->classM, p) : HeaderOf(p)->nByteM;
}
