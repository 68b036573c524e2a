// WalkStack: the explicit stack on which the object walkers keep their place in a tree of nested
// objects, so that the depth of an object tree never becomes depth of the C stack.
//
// Frames are plain data (copied with memcpy when the stack grows). The first kInline frames live
// in the stack object itself; deeper walks grow a block in the walker's pool, doubling it.
// Internal to the library.
#pragma once

#include <cstring>
#include <type_traits>

#include "vek/VekMempool.h"
#include "vek/VekServices.h"

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
  // A new, zeroed top frame.
  T& Push() {
    if (nCountM == nCapacityM) Grow();
    T& frame = pFramesM[nCountM++];
    std::memset(static_cast<void*>(&frame), 0, sizeof frame);
    return frame;
  }
  void Pop() { --nCountM; }

 private:
  void Grow() {
    unsigned capacity = nCapacityM * 2;
    T* frames = static_cast<T*>(pMempoolM->Malloc(sizeof(T) * capacity));
    // The writers have no error path; running out of memory is not an input error.
    VekAssert(frames != nullptr);
    std::memcpy(static_cast<void*>(frames), pFramesM, sizeof(T) * nCountM);
    if (pFramesM != inlineM) pMempoolM->Free(pFramesM);
    pFramesM = frames;
    nCapacityM = capacity;
  }

  VekMempool* pMempoolM;
  T* pFramesM;
  unsigned nCapacityM;
  unsigned nCountM;
  T inlineM[kInline];
};

}  // namespace internal
}  // namespace sarn
