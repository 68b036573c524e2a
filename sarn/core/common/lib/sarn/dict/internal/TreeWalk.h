// Internal: the walks over a value tree that every value class shares (release, equality, JSON
// writing). Not installed; used only inside libsarn.
#pragma once

#include "sarn/dict/Dictionary.h"

namespace sarn {
namespace internal {

// The per-thread release queue. Releasing a container's children one by one through DownRef
// would recurse once per nesting level, so a tree deep enough exhausts the native stack however
// it was built. Instead a container whose last reference is being dropped is queued, and the
// outermost release on the thread drains the queue: every container's destructor then only
// queues its own nested containers, and the stack stays flat at any depth.
class TreeRelease {
 public:
  // Drops the one reference held in `value` (null allowed).
  static void Release(DictValue* value);
  // Drops the reference held in `holder` and clears it.
  template <class T>
  static void Release(ref<T>& holder) {
    T* value = holder.Get();
    if (value == nullptr) return;
    value->UpRef();
    holder.Reset();
    Release(static_cast<DictValue*>(value));
  }

 private:
  static DictValue*& Link(DictValue* value);
};

// Equality and JSON writing, dispatched on kindM. Both recurse once per nesting level, which
// the readers bound (JsonLimits), so a tree a reader built is walked within that bound.
class TreeWalk {
 public:
  // `a` by its own rule against `b` (null allowed: never equal).
  static bool Equal(const DictValue& a, const DictValue* b);
  static void Write(const DictValue& value, ByteBuffer& out, JsonFormat format);
  static void Write(const DictValue& value, wynbaselib::Bytesink& out, JsonFormat format);
  // Compact, with each payload inside written by WriteComparableJson (LazyDictSupport.h).
  static void WriteComparable(const DictValue& value, ByteBuffer& out);
};

}  // namespace internal
}  // namespace sarn
