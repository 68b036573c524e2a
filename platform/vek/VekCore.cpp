#include "vek/VekCore.h"

#include "vek/VekServices.h"

namespace {
// The counted new hands the pool to the constructor through a short per-thread list of
// (address, pool) pairs: a constructor takes its pool only when it builds the object at
// exactly an address the counted new returned, so a VekCore made any other way (on the
// stack, say) gets the default pool. A list rather than one slot because the arguments of
// `new (pool) A(...)` are evaluated after A's memory is allocated and may themselves make
// counted objects, whose constructors run before A's.
struct PendingObject {
  void* pObjectM;
  VekMempool* pPoolM;
};
constexpr int kMaxPendingG = 16;
// The initial-exec model keeps every counted new and constructor off the general TLS call.
thread_local PendingObject vPendingG[kMaxPendingG] __attribute__((tls_model("initial-exec")));
thread_local int nPendingG __attribute__((tls_model("initial-exec"))) = 0;

void PushPending(void* p, VekMempool* pool) {
  if (nPendingG == kMaxPendingG) {
    // Deeper nesting than any real code: forget the oldest (its object falls back to the
    // default pool for GetMempool, while its memory still returns to the right pool).
    for (int i = 1; i < kMaxPendingG; ++i) vPendingG[i - 1] = vPendingG[i];
    --nPendingG;
  }
  vPendingG[nPendingG++] = PendingObject{p, pool};
}

// Removes the entry for `p` and returns its pool, or null when `p` is not pending.
VekMempool* TakePending(const void* p) {
  for (int i = nPendingG - 1; i >= 0; --i) {
    if (vPendingG[i].pObjectM != p) continue;
    VekMempool* pool = vPendingG[i].pPoolM;
    for (int j = i + 1; j < nPendingG; ++j) vPendingG[j - 1] = vPendingG[j];
    --nPendingG;
    return pool;
  }
  return nullptr;
}

const char kVekCoreClassKeyG = 0;
}  // namespace

VekCore::VekCore() : pMempoolM(nullptr), refCountM(0) {
  VekMempool* pool = nPendingG != 0 ? TakePending(this) : nullptr;
  pMempoolM = pool != nullptr ? pool : VekMempool::Default();
}

VekCore::~VekCore() {}

void* VekCore::operator new(size_t size, VekMempool* pool) noexcept {
  if (pool == nullptr) pool = VekMempool::Default();
  void* p = pool->Malloc(size);
  // Nothing is pending for a failed allocation: no constructor will run for it.
  if (p == nullptr) return nullptr;
  PushPending(p, pool);
  return p;
}

void VekCore::operator delete(void* p) {
  if (p == nullptr) return;
  VekMempool* pool = VekMempool::PoolOf(p);
  VekAssert(pool != nullptr);
  pool->Free(p);
}

void VekCore::operator delete(void* p, VekMempool* pool) noexcept {
  if (p == nullptr) return;
  TakePending(p);
  (pool != nullptr ? pool : VekMempool::Default())->Free(p);
}

const void* VekCore::ZoCastHelper(const void* classKey) const {
  return classKey == &kVekCoreClassKeyG ? this : nullptr;
}
