// WalkStack: the explicit stack on which the object walkers keep their place in a tree of nested
// objects, so that the depth of an object tree never becomes depth of the C stack.
//
// Frames are plain data (copied with memcpy when the stack grows). The first kInline frames live
// in the stack object itself; deeper walks grow a block in the walker's pool, doubling it. When
// the pool cannot supply a bigger block, Push returns null and the stack stays as it was, so the
// walker can unwind and report the failure. Internal to the library.
#pragma once

#include <climits>
#include <cstdint>
#include <cstring>
#include <type_traits>

#include "vek/VekMempool.h"

namespace sarn {
namespace internal {

template <class T, unsigned kInline = 16>
class WalkStack {
  static_assert(std::is_trivially_copyable<T>::value, "frames are copied as bytes");

 public:
  explicit WalkStack(VekMempool* pool) : pMempoolM(pool), pFramesM(inlineM), nCapacityM(kInline), nCountM(0) {}
  ~WalkStack() {
    if (pFramesM != inlineM) pMempoolM->Free(pFramesM);
  }
  WalkStack(const WalkStack&) = delete;
  WalkStack& operator=(const WalkStack&) = delete;

  bool Empty() const { return nCountM == 0; }
  unsigned Count() const { return nCountM; }
  // The top frame; references stay valid until the next Push.
  T& Top() { return pFramesM[nCountM - 1]; }
  // Frame `i` from the bottom (below Count); valid until the next Push.
  T& At(unsigned i) { return pFramesM[i]; }
  // A new, zeroed top frame; null when the stack cannot grow.
  T* Push() {
    if (nCountM == nCapacityM && !Grow()) return nullptr;
    T* frame = &pFramesM[nCountM++];
    std::memset(static_cast<void*>(frame), 0, sizeof *frame);
    return frame;
  }
  void Pop() { --nCountM; }

 private:
  bool Grow() {
    if (nCapacityM > UINT_MAX / 2 || static_cast<size_t>(nCapacityM) * 2 > SIZE_MAX / sizeof(T)) return false;
    unsigned capacity = nCapacityM * 2;
    T* frames = static_cast<T*>(pMempoolM->Malloc(sizeof(T) * capacity));
    if (frames == nullptr) return false;
    std::memcpy(static_cast<void*>(frames), pFramesM, sizeof(T) * nCountM);
    if (pFramesM != inlineM) pMempoolM->Free(pFramesM);
    pFramesM = frames;
    nCapacityM = capacity;
    return true;
  }

  VekMempool* pMempoolM;
  T* pFramesM;
  unsigned nCapacityM;
  unsigned nCountM;
  T inlineM[kInline];
};

}  // namespace internal
}  // namespace sarn
