#include "vek/VekMempool.h"

#include <cassert>
#include <cstdio>
#include <cstdlib>
#include <cstring>
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

inline size_t ClassOf(size_t nByte) {
  // Class c serves payloads of (c * 16, (c + 1) * 16] bytes; 0 bytes uses class 0.
  return nByte == 0 ? 0 : (nByte - 1) / VekMempool::kClassGranularity;
}

}  // namespace

VekMempool::VekMempool(const char* name) {
  std::snprintf(nameM, sizeof nameM, "%s", name != nullptr ? name : "");
}

VekMempool::~VekMempool() {
  if (liveBlocksM != 0) {
    std::fprintf(stderr, "VekMempool '%s' destroyed with %zu live blocks (%zu bytes)\n", nameM, liveBlocksM,
                 usedBytesM);
    assert(liveBlocksM == 0 && "pool destroyed with live allocations");
  }
  for (size_t c = 0; c < kNumClasses; ++c) {
    FreeNode* node = vFreeM[c];
    while (node != nullptr) {
      FreeNode* next = node->pNextM;
      std::free(reinterpret_cast<char*>(node) - sizeof(BlockHeader));
      node = next;
    }
  }
}

VekMempool* VekMempool::Default() {
  // Never destroyed: objects in the default pool may be released by static destructors.
  static VekMempool* pool = new VekMempool("default");
  return pool;
}

void VekMempool::Lock() const {
  while (lockM.test_and_set(std::memory_order_acquire)) {
  }
}

void VekMempool::Unlock() const { lockM.clear(std::memory_order_release); }

void* VekMempool::Malloc(size_t nByte) {
  void* payload = nullptr;
  if (nByte <= kMaxSmallBlock) {
    size_t c = ClassOf(nByte);
    Lock();
    FreeNode* node = vFreeM[c];
    if (node != nullptr) {
      vFreeM[c] = node->pNextM;
      --vFreeCountM[c];
    }
    usedBytesM += nByte;
    ++liveBlocksM;
    if (usedBytesM > highWaterM) highWaterM = usedBytesM;
    Unlock();
    if (node == nullptr) {
      char* raw = static_cast<char*>(std::malloc(sizeof(BlockHeader) + (c + 1) * kClassGranularity));
      if (raw == nullptr) {
        Lock();
        usedBytesM -= nByte;
        --liveBlocksM;
        Unlock();
        return nullptr;
      }
      payload = raw + sizeof(BlockHeader);
    } else {
      payload = node;
    }
  } else {
    if (nByte > SIZE_MAX - sizeof(BlockHeader)) return nullptr;
    char* raw = static_cast<char*>(std::malloc(sizeof(BlockHeader) + nByte));
    if (raw == nullptr) return nullptr;
    payload = raw + sizeof(BlockHeader);
    Lock();
    usedBytesM += nByte;
    ++liveBlocksM;
    if (usedBytesM > highWaterM) highWaterM = usedBytesM;
    Unlock();
  }
  BlockHeader* header = HeaderOf(payload);
  header->nByteM = nByte;
  header->pPoolM = this;
  return payload;
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
  size_t old = HeaderOf(p)->nByteM;
  // Stay in place while the block's size class still fits.
  if (old <= kMaxSmallBlock && nByte <= kMaxSmallBlock && ClassOf(old) == ClassOf(nByte)) {
    Lock();
    usedBytesM = usedBytesM - old + nByte;
    if (usedBytesM > highWaterM) highWaterM = usedBytesM;
    Unlock();
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
    size_t c = ClassOf(nByte);
    bool cached = false;
    Lock();
    usedBytesM -= nByte;
    --liveBlocksM;
    if ((vFreeCountM[c] + 1) * (c + 1) * kClassGranularity <= kMaxCachedBytesPerClass) {
      FreeNode* node = static_cast<FreeNode*>(p);
      node->pNextM = vFreeM[c];
      vFreeM[c] = node;
      ++vFreeCountM[c];
      cached = true;
    }
    Unlock();
    if (!cached) std::free(header);
    return;
  }
  Lock();
  usedBytesM -= nByte;
  --liveBlocksM;
  Unlock();
  std::free(header);
}

size_t VekMempool::GetUsedBytes() const {
  Lock();
  size_t n = usedBytesM;
  Unlock();
  return n;
}

size_t VekMempool::GetUsedBytesHighWater() const {
  Lock();
  size_t n = highWaterM;
  Unlock();
  return n;
}

size_t VekMempool::GetLiveBlocks() const {
  Lock();
  size_t n = liveBlocksM;
  Unlock();
  return n;
}

VekMempool* VekMempool::PoolOf(const void* p) { return p == nullptr ? nullptr : HeaderOf(p)->pPoolM; }

size_t VekMempool::SizeOf(const void* p) { return p == nullptr ? 0 : HeaderOf(p)->nByteM; }
