// WalkStack: the explicit stack on which the object walkers keep their place in a tree of nested
// objects, so that the depth of an object tree never becomes depth of the C stack.
//
// Frames are plain data (copied with memcpy when the stack grows). The first kInline frames live
// in the stack object itself; deeper walks grow a block in the walker's pool, doubling it.
// Running out of memory fails the stack rather than the push (see Push): the walkers have one
// place to check, after the walk. Internal to the library.
#pragma once

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
  // A new, zeroed top frame. When the frames cannot grow, a zeroed spare frame instead, which
  // the walk fills but never visits (Top stays where it was), so that subtree is left out and
  // the stack is failed: the walker's caller must then report a failure.
  T& Push() {
    if (nCountM == nCapacityM && !Grow()) {
      isFailedM = true;
      std::memset(static_cast<void*>(&spareM), 0, sizeof spareM);
      return spareM;
    }
    T& frame = pFramesM[nCountM++];
    std::memset(static_cast<void*>(&frame), 0, sizeof frame);
    return frame;
  }
  void Pop() { --nCountM; }
  // True once a push found no memory: the walk left something out.
  bool HasFailed() const { return isFailedM; }

 private:
  bool Grow() {
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
  bool isFailedM = false;
  T spareM;
  T inlineM[kInline];
};

}  // namespace internal
}  // namespace sarn
