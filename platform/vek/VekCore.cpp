#include "vek/VekCore.h"

#include "vek/VekServices.h"

namespace {
// The counted new hands the pool to the constructor through this slot: the constructor
// takes it only when it builds the object at exactly the address the counted new returned,
// so a VekCore made any other way (on the stack, say) gets the default pool.
thread_local void* tPendingObjectG = nullptr;
thread_local VekMempool* tPendingPoolG = nullptr;
const char kVekCoreClassKeyG = 0;
}  // namespace

VekCore::VekCore() : pMempoolM(nullptr), refCountM(0) {
  if (tPendingObjectG == this) {
    pMempoolM = tPendingPoolG;
    tPendingObjectG = nullptr;
    tPendingPoolG = nullptr;
  } else {
    pMempoolM = VekMempool::Default();
  }
}

VekCore::~VekCore() {}

void* VekCore::operator new(size_t size, VekMempool* pool) {
  if (pool == nullptr) pool = VekMempool::Default();
  void* p = pool->Malloc(size);
  if (p == nullptr) throw std::bad_alloc();
  tPendingObjectG = p;
  tPendingPoolG = pool;
  return p;
}

void VekCore::operator delete(void* p) {
  if (p == nullptr) return;
  VekMempool* pool = VekMempool::PoolOf(p);
  VekAssert(pool != nullptr);
  pool->Free(p);
}

void VekCore::operator delete(void* p, VekMempool* pool) {
  tPendingObjectG = nullptr;
  tPendingPoolG = nullptr;
  if (p != nullptr) pool->Free(p);
}

const void* VekCore::ZoCastHelper(const void* classKey) const {
  return classKey == &kVekCoreClassKeyG ? this : nullptr;
}
