// The hash function, the bucket sizes and the global name cache.
#include "sarn/model/SarnHashTable.h"

#include <new>

#include "vek/VekServices.h"

const int SarnHashTableUtil::hashTableSizesG[16] = {
    53,      769,      3079,     12289,    49157,    98317,    196613,    393241,
    786433,  1572869,  3145739,  6291469,  12582917, 25165843, 50331653, 100663319,
};

namespace {

inline uint32_t Rot(uint32_t x, int k) { return (x << k) | (x >> (32 - k)); }

// Little-endian 32-bit word from 4 bytes, whatever the alignment.
inline uint32_t Word(const unsigned char* p) {
  return (uint32_t)p[0] | (uint32_t)p[1] << 8 | (uint32_t)p[2] << 16 | (uint32_t)p[3] << 24;
}

}  // namespace

unsigned int SarnHashTableUtil::Hash(const unsigned char* data, int length) {
  uint32_t a, b, c;
  a = b = c = 0xDEADBEEFu + static_cast<uint32_t>(length);
  while (length > 12) {
    a += Word(data);
    b += Word(data + 4);
    c += Word(data + 8);
    a -= c; a ^= Rot(c, 4);  c += b;
    b -= a; b ^= Rot(a, 6);  a += c;
    c -= b; c ^= Rot(b, 8);  b += a;
    a -= c; a ^= Rot(c, 16); c += b;
    b -= a; b ^= Rot(a, 19); a += c;
    c -= b; c ^= Rot(b, 4);  b += a;
    data += 12;
    length -= 12;
  }
  switch (length) {  // every case falls through to the ones below it
    case 12: c += (uint32_t)data[11] << 24; [[fallthrough]];
    case 11: c += (uint32_t)data[10] << 16; [[fallthrough]];
    case 10: c += (uint32_t)data[9] << 8; [[fallthrough]];
    case 9: c += data[8]; [[fallthrough]];
    case 8: b += (uint32_t)data[7] << 24; [[fallthrough]];
    case 7: b += (uint32_t)data[6] << 16; [[fallthrough]];
    case 6: b += (uint32_t)data[5] << 8; [[fallthrough]];
    case 5: b += data[4]; [[fallthrough]];
    case 4: a += (uint32_t)data[3] << 24; [[fallthrough]];
    case 3: a += (uint32_t)data[2] << 16; [[fallthrough]];
    case 2: a += (uint32_t)data[1] << 8; [[fallthrough]];
    case 1: a += data[0]; break;
    default: break;
  }
  // The final mix runs for the empty key too, so that it does not hash to the bare seed.
  c ^= b; c -= Rot(b, 14);
  a ^= c; a -= Rot(c, 11);
  b ^= a; b -= Rot(a, 25);
  c ^= b; c -= Rot(b, 16);
  a ^= c; a -= Rot(c, 4);
  b ^= a; b -= Rot(a, 14);
  c ^= b; c -= Rot(b, 24);
  return c;
}

namespace sarn {

namespace {

// Everything below is guarded by the lock. The lock is a plain static: its flag is clear from
// zero-initialisation, so it works even before its constructor has run.
VekSpinLock globalNameLockG("SarnHashTable", 2);
SarnNameTable* pGlobalNameTableG = nullptr;
VekMempool* pGlobalNamePoolG = nullptr;

void DestroyLocked() {
  if (pGlobalNameTableG == nullptr) return;
  // Clearing releases every block and bucket array, so the pool is empty when it goes.
  delete pGlobalNameTableG;
  pGlobalNameTableG = nullptr;
  delete pGlobalNamePoolG;
  pGlobalNamePoolG = nullptr;
}

}  // namespace

SarnHashTableDestructor hashTableDestructor;

const VekString* GetGlobalName(VekMempool* pool, const char* name) {
  VekSpinLockGuard guard(globalNameLockG);
  if (pGlobalNameTableG == nullptr) {
    // Without memory for the cache itself every caller gets null, as for a name that cannot be
    // stored; a later call tries again.
    if (pGlobalNamePoolG == nullptr) pGlobalNamePoolG = new (std::nothrow) VekMempool("sarn name cache");
    if (pGlobalNamePoolG == nullptr) return nullptr;
    pGlobalNameTableG = new (std::nothrow) SarnNameTable(pGlobalNamePoolG);
    if (pGlobalNameTableG == nullptr) return nullptr;
  }
  VekString* value;
  if (!pGlobalNameTableG->Put(name, value) && value != nullptr) *value = VekString(name);
  return value;
}

void DestroyGlobalSarnHashTable() {
  VekSpinLockGuard guard(globalNameLockG);
  DestroyLocked();
}

SarnHashTableDestructor::~SarnHashTableDestructor() {
  VekSpinLockGuard guard(globalNameLockG);
  DestroyLocked();
}

}  // namespace sarn
