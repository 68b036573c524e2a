// What the two files of the lazy payload share: the form a conversion answers as, the count of
// conversions running inside one another, and the conversions between the forms.
//
// Thread safety: the nesting count is per thread; everything else works on the caller's payload.
#pragma once

#include <cstddef>

#include "sarn/base/Limits.h"
#include "sarn/dict/LazyDict.h"

namespace sarn {
namespace internal {

// One conversion running on this thread; conversions that a writer, another conversion or a
// comparison starts inside it count one level more. A walker that converts payloads one inside
// another without recursing (the binary writer) passes the levels around the conversion itself.
// Too deep: past Limits::kDefaultMaxDepth levels, or past kLazyNestingStackBytes of native stack
// below the outermost conversion (sanitizers and unoptimised builds get eight times the room, as
// their frames are that much larger).
class LazyNesting {
 public:
  explicit LazyNesting(int levels = 1) : levelsM(levels) {
    const char* here = static_cast<const char*>(__builtin_frame_address(0));
    if (depthG == 0) pOutermostG = here;
    depthG += levels;
    isTooDeepM = depthG > Limits::kDefaultMaxDepth ||
                 (depthG > 1 && static_cast<size_t>(pOutermostG - here) > kStackBytes);
  }
  ~LazyNesting() { depthG -= levelsM; }
  LazyNesting(const LazyNesting&) = delete;
  LazyNesting& operator=(const LazyNesting&) = delete;
  bool IsTooDeep() const { return isTooDeepM; }
  // Whether a conversion started now would be past the level limit.
  static bool IsNextTooDeep() { return depthG + 1 > Limits::kDefaultMaxDepth; }

 private:
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__) || !defined(__OPTIMIZE__)
  static constexpr size_t kStackBytes = 8 * kLazyNestingStackBytes;
#else
  static constexpr size_t kStackBytes = kLazyNestingStackBytes;
#endif
  int levelsM;
  bool isTooDeepM;
  static thread_local int depthG;
  static thread_local const char* pOutermostG;
};

// Not a value of the enum: a representation outside it, or a form whose member is missing.
constexpr LazyDict::Rep kBadRep = static_cast<LazyDict::Rep>(0xFFFFFFFFu);

// The form a conversion answers as: the payload's own (objectM set for REP_OBJECT), kBadRep, or,
// past the nesting limit, REP_OBJECT with the "error" object that names the limit.
struct LazyForm {
  LazyDict::Rep repM;
  ref<SarnObject> objectM;
};
LazyForm FormOf(const LazyDict& payload, const LazyNesting& nesting);

// A fresh duplicate of the source through the streaming reader: `out` is whatever the reader
// returned; true for a whole dictionary, otherwise the reason in `error`.
bool ReadBytesource(const LazyDict& payload, ref<Dictionary>& out, VekString& error);
// Stored JSON as a tree, or the "error" tree with the reader's message.
ref<Dictionary> JsonToDictionaryOrError(const LazyDict& payload);
// The payload's tree in the given form; on failure null with `error`, or with `isErrorTree` the
// "error" tree of stored JSON or a byte source that does not parse. The Dict and Dictionary forms
// give their own tree.
ref<Dictionary> TreeOf(const LazyDict& payload, const LazyForm& form, VekString& error, bool isErrorTree);

// ToDict() of the payload in the given form.
ref<Dict> DictOf(const LazyDict& payload, const LazyForm& form);
// What equality compares: the compact JSON of the payload's ToDict() tree, with every payload
// inside it written the same way (its tree, not its own form's text), within one nesting level
// per payload. The buffer fails when memory runs out.
void WriteComparableJson(const LazyDict& payload, ByteBuffer& out);

// Stored protocol-buffer bytes as an object; the "error" object "protobuf did not unmarshal"
// when they do not read. Null only when memory runs out.
ref<SarnObject> ProtobufToObject(const LazyDict& payload);
// An object as JSON under the payload's version: compact by the direct writer, pretty through a
// Dictionary; into a sink compact only with feature 548, in pieces.
void ObjectToJson(const LazyDict& payload, const SarnObject* object, ByteBuffer& out, bool pretty);
void ObjectToJson(const LazyDict& payload, const SarnObject* object, wynbaselib::Bytesink& out, bool pretty);

}  // namespace internal
}  // namespace sarn
