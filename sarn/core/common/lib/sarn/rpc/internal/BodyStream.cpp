#include "sarn/rpc/internal/BodyStream.h"

#include <cstring>
#include <new>

namespace sarn {
namespace internal {

BodyStream::BodyStream(VekMempool* pool) : pContentM(nullptr), pBlockM(nullptr), offsetM(0) {
  void* memory = pool->Malloc(sizeof(Content));
  if (memory != nullptr) pContentM = new (memory) Content{{1}, pool, nullptr, nullptr, 0};
}

BodyStream::BodyStream(const BodyStream& other)
    : pContentM(other.pContentM), pBlockM(other.pBlockM), offsetM(other.offsetM) {
  if (pContentM != nullptr) pContentM->refCountM.fetch_add(1, std::memory_order_relaxed);
}

BodyStream::~BodyStream() {
  if (pContentM == nullptr || pContentM->refCountM.fetch_sub(1, std::memory_order_acq_rel) != 1) return;
  VekMempool* pool = pContentM->pMempoolM;
  for (Block* block = pContentM->pFirstM; block != nullptr;) {
    Block* next = block->pNextM;
    pool->Free(block);
    block = next;
  }
  pContentM->~Content();
  pool->Free(pContentM);
}

size_t BodyStream::Read(void* buffer, size_t size) {
  if (pContentM == nullptr) return 0;
  size_t done = 0;
  char* out = static_cast<char*>(buffer);
  while (done < size) {
    if (pBlockM == nullptr || offsetM == pBlockM->sizeM) {
      Block* next = pBlockM == nullptr ? pContentM->pFirstM : pBlockM->pNextM;
      if (next == nullptr) break;
      pBlockM = next;
      offsetM = 0;
    }
    size_t n = pBlockM->sizeM - offsetM;
    if (n > size - done) n = size - done;
    std::memcpy(out + done, pBlockM->Data() + offsetM, n);
    offsetM += n;
    done += n;
  }
  return done;
}

wynbaselib::Bytesource* BodyStream::Duplicate() { return new (std::nothrow) BodyStream(*this); }

bool BodyStream::Write(const char* data, size_t size) {
  if (pContentM == nullptr) return false;
  if (size == 0) return true;
  Block* block = static_cast<Block*>(pContentM->pMempoolM->Malloc(sizeof(Block) + size));
  if (block == nullptr) return false;
  block->pNextM = nullptr;
  block->sizeM = size;
  std::memcpy(block->Data(), data, size);
  (pContentM->pLastM != nullptr ? pContentM->pLastM->pNextM : pContentM->pFirstM) = block;
  pContentM->pLastM = block;
  pContentM->sizeM += size;
  return true;
}

size_t BodyStream::GetSize() const { return pContentM != nullptr ? pContentM->sizeM : 0; }

}  // namespace internal
}  // namespace sarn
