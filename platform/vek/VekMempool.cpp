#include "vek/VekMempool.h"

#include <cassert>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <initializer_list>
#include <new>

// Every block starts with a 16-byte header so that the payload keeps malloc's 16-byte
// alignment: the requested size (for exact accounting and Realloc) and the owning pool.
namespace {

struct BlockHeader {
  size_t nByteM;
  VekMempool* pPoolM;
};
static_assert(sizeof(BlockHeader) == 16, "block header keeps 16-byte alignment");

inline BlockHeader* HeaderOf(const void* p) {
  return reinterpret_cast<BlockHeader*>(const_cast<char*>(static_cast<const char*>(p)) - sizeof(BlockHeader));
}

// Under AddressSanitizer freed blocks go straight back to the C library, so that a use after
// free inside a pool is caught instead of hidden by recycling.
#if defined(__SANITIZE_ADDRESS__)
constexpr bool kIsRecyclingG = false;
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
constexpr bool kIsRecyclingG = false;
#else
constexpr bool kIsRecyclingG = true;
#endif
#else
constexpr bool kIsRecyclingG = true;
#endif

inline size_t ClassOf(size_t nByte) {
  // Class c serves payloads of (c * 16, (c + 1) * 16] bytes; 0 bytes uses class 0.
  return nByte == 0 ? 0 : (nByte - 1) / VekMempool::kClassGranularity;
}

}  // namespace

// The address of a thread-local byte identifies the calling thread at the cost of one load
// (the initial-exec model keeps it off the slow general TLS path in this shared library).
// When a thread ends and a new one reuses its storage, the new one becomes the owner of the
// old one's pools; the old one can no longer race with it.
namespace {
thread_local char tThreadMarkerG __attribute__((tls_model("initial-exec")));
}  // namespace

VekMempool::VekMempool(const char* name) : pOwnerM(&tThreadMarkerG) {
  std::snprintf(nameM, sizeof nameM, "%s", name != nullptr ? name : "");
}

VekMempool::~VekMempool() {
  size_t live = GetLiveBlocks();
  if (live != 0) {
    std::fprintf(stderr, "VekMempool '%s' destroyed with %zu live blocks (%zu bytes)\n", nameM, live,
                 GetUsedBytes());
    assert(live == 0 && "pool destroyed with live allocations");
  }
  for (FreeNode** lists : {vOwnerFreeM, vSharedFreeM}) {
    for (size_t c = 0; c < kNumClasses; ++c) {
      FreeNode* node = lists[c];
      while (node != nullptr) {
        FreeNode* next = node->pNextM;
        std::free(HeaderOf(node));
        node = next;
      }
    }
  }
}

VekMempool* VekMempool::Default() {
  // Never destroyed: objects in the default pool may be released by static destructors.
  static VekMempool* pool = new VekMempool("default");
  return pool;
}

inline bool VekMempool::IsOwnerThread() const { return pOwnerM == &tThreadMarkerG; }

inline void VekMempool::Count(bool isOwner, size_t nByte, size_t nBlock) {
  if (isOwner) {
    // Only the owner writes these, so a load and a store suffice (others only read them).
    ownerUsedM.store(ownerUsedM.load(std::memory_order_relaxed) + nByte, std::memory_order_relaxed);
    ownerLiveM.store(ownerLiveM.load(std::memory_order_relaxed) + nBlock, std::memory_order_relaxed);
  } else {
    sharedUsedM.fetch_add(nByte, std::memory_order_relaxed);
    sharedLiveM.fetch_add(nBlock, std::memory_order_relaxed);
  }
}

inline void VekMempool::RaiseHighWater() {
  size_t used = GetUsedBytes();
  // A sum that looks negative mixes a free seen on one side with an allocation not yet seen on
  // the other; it is never a peak.
  if (used > SIZE_MAX / 2) return;
  size_t high = highWaterM.load(std::memory_order_relaxed);
  while (used > high && !highWaterM.compare_exchange_weak(high, used, std::memory_order_relaxed)) {
  }
}

void* VekMempool::MallocSmall(size_t nByte) {
  size_t c = ClassOf(nByte);
  bool isOwner = IsOwnerThread();
  FreeNode* node = nullptr;
  if (isOwner) {
    node = vOwnerFreeM[c];
    if (node == nullptr && sharedFreeBlocksM.load(std::memory_order_relaxed) != 0) {
      // Take back what other threads freed in this class, all at once.
      lockM.Lock();
      node = vSharedFreeM[c];
      vOwnerFreeCountM[c] = vSharedFreeCountM[c];
      sharedFreeBlocksM.fetch_sub(vSharedFreeCountM[c], std::memory_order_relaxed);
      vSharedFreeM[c] = nullptr;
      vSharedFreeCountM[c] = 0;
      lockM.Unlock();
    }
    if (node != nullptr) {
      vOwnerFreeM[c] = node->pNextM;
      --vOwnerFreeCountM[c];
    }
  } else if (sharedFreeBlocksM.load(std::memory_order_relaxed) != 0) {
    lockM.Lock();
    node = vSharedFreeM[c];
    if (node != nullptr) {
      vSharedFreeM[c] = node->pNextM;
      --vSharedFreeCountM[c];
      sharedFreeBlocksM.fetch_sub(1, std::memory_order_relaxed);
    }
    lockM.Unlock();
  }
  char* payload;
  if (node != nullptr) {
    payload = reinterpret_cast<char*>(node);
  } else {
    char* raw = static_cast<char*>(std::malloc(sizeof(BlockHeader) + (c + 1) * kClassGranularity));
    if (raw == nullptr) return nullptr;
    payload = raw + sizeof(BlockHeader);
  }
  Count(isOwner, nByte, 1);
  RaiseHighWater();
  BlockHeader* header = HeaderOf(payload);
  header->nByteM = nByte;
  header->pPoolM = this;
  return payload;
}

void VekMempool::FreeSmall(void* p, size_t nByte) {
  size_t c = ClassOf(nByte);
  size_t classBytes = (c + 1) * kClassGranularity;
  FreeNode* node = static_cast<FreeNode*>(p);
  bool isOwner = IsOwnerThread();
  Count(isOwner, 0 - nByte, 0 - size_t{1});
  if (!kIsRecyclingG) {
    std::free(HeaderOf(p));
    return;
  }
  if (isOwner) {
    if ((vOwnerFreeCountM[c] + 1) * classBytes <= kMaxCachedBytesPerClass) {
      node->pNextM = vOwnerFreeM[c];
      vOwnerFreeM[c] = node;
      ++vOwnerFreeCountM[c];
      return;
    }
  } else {
    lockM.Lock();
    bool isCached = (vSharedFreeCountM[c] + 1) * classBytes <= kMaxCachedBytesPerClass;
    if (isCached) {
      node->pNextM = vSharedFreeM[c];
      vSharedFreeM[c] = node;
      ++vSharedFreeCountM[c];
      sharedFreeBlocksM.fetch_add(1, std::memory_order_relaxed);
    }
    lockM.Unlock();
    if (isCached) return;
  }
  std::free(HeaderOf(p));
}

bool VekMempool::IsFailingForTest() {
  long n = failCountdownM.load(std::memory_order_relaxed);
  while (n >= 0 && !failCountdownM.compare_exchange_weak(n, n - 1, std::memory_order_relaxed)) {
  }
  return n == 0;
}

void* VekMempool::Malloc(size_t nByte) {
  if (failCountdownM.load(std::memory_order_relaxed) >= 0 && IsFailingForTest()) return nullptr;
  if (nByte <= kMaxSmallBlock) return MallocSmall(nByte);
  if (nByte > SIZE_MAX - sizeof(BlockHeader)) return nullptr;
  char* raw = static_cast<char*>(std::malloc(sizeof(BlockHeader) + nByte));
  if (raw == nullptr) return nullptr;
  Count(IsOwnerThread(), nByte, 1);
  RaiseHighWater();
  BlockHeader* header = reinterpret_cast<BlockHeader*>(raw);
  header->nByteM = nByte;
  header->pPoolM = this;
  return raw + sizeof(BlockHeader);
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
  size_t old = HeaderOf(p)->nByteM;
  // Stay in place while the block's size class still fits.
  if (old <= kMaxSmallBlock && nByte <= kMaxSmallBlock && ClassOf(old) == ClassOf(nByte)) {
    Count(IsOwnerThread(), nByte - old, 0);
    if (nByte > old) RaiseHighWater();
    HeaderOf(p)->nByteM = nByte;
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
  BlockHeader* header = HeaderOf(p);
  assert(header->pPoolM == this && "block freed to a pool that did not allocate it");
  size_t nByte = header->nByteM;
  if (nByte <= kMaxSmallBlock) {
    FreeSmall(p, nByte);
    return;
  }
  Count(IsOwnerThread(), 0 - nByte, 0 - size_t{1});
  std::free(header);
}

size_t VekMempool::GetUsedBytes() const {
  return ownerUsedM.load(std::memory_order_relaxed) + sharedUsedM.load(std::memory_order_relaxed);
}

size_t VekMempool::GetUsedBytesHighWater() const { return highWaterM.load(std::memory_order_relaxed); }

size_t VekMempool::GetLiveBlocks() const {
  return ownerLiveM.load(std::memory_order_relaxed) + sharedLiveM.load(std::memory_order_relaxed);
}

VekMempool* VekMempool::PoolOf(const void* p) { return p == nullptr ? nullptr : HeaderOf(p)->pPoolM; }

size_t VekMempool::SizeOf(const void* p) { return p == nullptr ? 0 : HeaderOf(p)->nByteM; }
