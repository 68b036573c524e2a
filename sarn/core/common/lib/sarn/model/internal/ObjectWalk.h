// ObjectWalk: the one walk over a tree of schema objects that the object writers share (JSON text,
// Dictionary trees, protocol-buffer bytes) and, in its paired form, equality, so that the order of
// fields, the version rule,
// presence, null references and nesting are decided in one place and each writer keeps only what
// its format adds.
//
// The walk keeps its place on an explicit stack (WalkStack): one frame per object being walked,
// none per field or element, so the depth of the object tree never becomes depth of the C stack.
// For each object it visits the fields in field-number order that take part at the frame's
// version, skips an OPTIONAL field that is not present, an empty array, data types without
// values (codes past 20) and null references of the kinds whose null is no value (dictionaries,
// objects, lazy payloads: DataTypeTraits::IsNullAbsent). A field with nothing left to visit is not
// reported at all, so a writer never has to take back a name it wrote.
//
// The visitor (the first template argument, called without virtual dispatch):
//   using FrameData = ...;                    trivially copyable state kept per object frame
//   void BeginObject(Frame& frame, Frame* parent);   parent: null for the walk's first object
//   void BeginField(Frame& frame);            frame.pFieldM, pNameM, nFieldM, nElementM are set
//   bool Value(Frame& frame, unsigned i, Child& child);
//                                             value i of the field; to descend into a schema
//                                             object set child.pObjectM (and its version and
//                                             data); false stops the walk, which then fails
//   void EndField(Frame& frame);
//   void EndObject(Frame& frame);
// A descended object is walked completely (BeginObject to EndObject) before the next value of
// the parent's field.
//
// Paired walks (a visitor that declares `static constexpr bool kIsPaired = true`): two objects of
// one type side by side, the second one kept by the visitor in its frame data (equality). Nothing
// is skipped for the visitor: every field whose record takes part is offered first to
//   PairStep PairField(Frame& frame, const FieldInfo& field);
// which settles the field itself (PAIR_SKIP), asks for its values to be visited (PAIR_VISIT: all
// of them, null references included, since a null on one side may face a value on the other), or
// stops the walk (PAIR_STOP, Run returns false). BeginField and EndField are not called.
//
// Version policy (the second template argument): CURRENT_RECORDS takes each field's current
// record, filtered by the version (0: every record whose arity is not NONE); OLDER_RECORDS lets an
// older record whose range holds the version replace the current one (FieldForVersion).
//
// Failure: when the stack cannot grow (the pool is out of memory) or the visitor returns false,
// Run returns false at once; no assert, no exception. References the walk holds are released.
// Internal to the library. Thread safety: one walk per thread; the objects are only read.
#pragma once

#include <cstdint>
#include <type_traits>

#include "sarn/base/internal/WalkStack.h"
#include "sarn/model/FieldAccess.h"
#include "sarn/model/SarnObject.h"
#include "sarn/model/Schema.h"

namespace sarn {
namespace internal {

enum class WalkVersions : uint8_t {
  CURRENT_RECORDS,
  OLDER_RECORDS,
};

// A paired visitor's answer for one field (see above).
enum PairStep : uint8_t { PAIR_SKIP, PAIR_VISIT, PAIR_STOP };

template <class V, class = void>
struct IsPairedVisitor : std::false_type {};
template <class V>
struct IsPairedVisitor<V, std::void_t<decltype(V::kIsPaired)>> : std::bool_constant<V::kIsPaired> {};

template <class Data>
struct WalkFrame {
  const SarnObject* pObjectM;
  const StructInfo* pInfoM;    // null for an object of no known type, and in a one-field walk
  const FieldInfo* pFieldM;    // the field being visited; null between fields
  const char* pNameM;          // its name (null in a one-field walk that was given none)
  KernoVersion versionM;
  unsigned nFieldM;            // its field number (0 in a one-field walk)
  unsigned nextFieldM;         // the next field number to look at
  unsigned nextElementM;       // the next value of pFieldM to visit
  unsigned nElementM;          // pFieldM's number of values
  bool isOwnedM;               // the walk holds a reference on pObjectM
  bool isOneFieldM;            // RunField's frame: ends with its field, without EndObject
  Data dataM;                  // the visitor's
};

template <class Data>
struct WalkChild {
  const SarnObject* pObjectM = nullptr;  // the object to walk next; null: nothing to walk
  KernoVersion versionM = 0;
  bool isOwnedM = false;                 // a reference the visitor took, released by the walk
  Data dataM{};                          // the new frame's initial state
};

template <class Visitor, WalkVersions kVersions>
class ObjectWalk {
 public:
  using Data = typename Visitor::FrameData;
  using Frame = WalkFrame<Data>;
  using Child = WalkChild<Data>;
  static_assert(std::is_trivially_copyable<Data>::value, "frame data is copied as bytes");
  static constexpr bool kIsPaired = IsPairedVisitor<Visitor>::value;

  ObjectWalk(VekMempool* pool, const StructInfo* const* structDefs, uint32_t nStructDefs)
      : stackM(pool), pStructDefsM(structDefs), nStructDefsM(nStructDefs) {}

  // The StructInfo of `object`'s type in the walk's table, or null (also for a null object).
  const StructInfo* InfoOf(const SarnObject* object) const {
    if (object == nullptr) return nullptr;
    uint32_t id = object->typeIdM;
    return id < nStructDefsM ? pStructDefsM[id] : nullptr;
  }

  // Walks `object` (read through `info`; null: an object without fields) and everything it holds.
  bool Run(Visitor& visitor, const SarnObject* object, const StructInfo* info, KernoVersion version,
           const Data& data) {
    Frame* frame = stackM.Push();
    if (frame == nullptr) return false;
    frame->pObjectM = object;
    frame->pInfoM = info;
    frame->versionM = version;
    frame->dataM = data;
    visitor.BeginObject(*frame, nullptr);
    return Walk(visitor);
  }
  bool Run(Visitor& visitor, const SarnObject* object, KernoVersion version, const Data& data) {
    return Run(visitor, object, InfoOf(object), version, data);
  }

  // Walks the one field `field` of `object` as if it were the only field of an object (its
  // presence is the caller's to test), starting from `data` and leaving the end state in it.
  bool RunField(Visitor& visitor, const SarnObject* object, const FieldInfo& field, const char* name,
                KernoVersion version, Data& data) {
    unsigned count = FieldAccess::StorageOf(field.dataType) == FieldAccess::STORAGE_NONE
                         ? 0
                         : FieldAccess::Count(object, field);
    unsigned first = FirstValue(object, field, 0, count);
    if (first == count) return true;
    Frame* frame = stackM.Push();
    if (frame == nullptr) return false;
    frame->pObjectM = object;
    frame->versionM = version;
    frame->isOneFieldM = true;
    frame->dataM = data;
    pOneFieldDataM = &data;
    StartField(visitor, *frame, &field, 0, name, first, count);
    return Walk(visitor);
  }

 private:
  // The first value at or after `i` that is visited: null references of the kinds whose null is
  // no value are passed over.
  static unsigned FirstValue(const SarnObject* object, const FieldInfo& field, unsigned i, unsigned count) {
    if (!TraitsOf(field.dataType).IsNullAbsent()) return i;
    while (i < count && FieldAccess::ReferenceAt(object, field, i) == nullptr) ++i;
    return i;
  }

  const FieldInfo* Select(const StructInfo* info, unsigned n, KernoVersion version) const {
    if constexpr (kVersions == WalkVersions::OLDER_RECORDS) {
      return FieldForVersion(info, n, version);
    } else {
      const FieldInfo& field = info->vFieldInfo[n];
      return FieldTakesPart(field, version) ? &field : nullptr;
    }
  }

  static void StartField(Visitor& visitor, Frame& frame, const FieldInfo* field, unsigned n, const char* name,
                         unsigned first, unsigned count) {
    frame.pFieldM = field;
    frame.nFieldM = n;
    frame.pNameM = name;
    frame.nextElementM = first;
    frame.nElementM = count;
    visitor.BeginField(frame);
  }

  enum FieldStep { FIELD_STARTED, FIELD_NONE, FIELD_FAILED };

  // Steps through the fields of the top frame to the next one with values to visit.
  FieldStep NextField(Visitor& visitor, Frame& frame) {
    const StructInfo* info = frame.pInfoM;
    if (info == nullptr) return FIELD_NONE;
    while (frame.nextFieldM < info->nFieldInfo) {
      unsigned n = frame.nextFieldM++;
      const FieldInfo* field = Select(info, n, frame.versionM);
      if (field == nullptr) continue;
      if constexpr (kIsPaired) {
        PairStep step = visitor.PairField(frame, *field);
        if (step == PAIR_STOP) return FIELD_FAILED;
        if (step == PAIR_SKIP) continue;
        frame.pFieldM = field;
        frame.nFieldM = n;
        frame.pNameM = nullptr;
        frame.nextElementM = 0;
        frame.nElementM = FieldAccess::Count(frame.pObjectM, *field);
        return FIELD_STARTED;
      } else {
        // Codes past the traits table have no values.
        if (field->dataType >= kDataTypeCountG) continue;
        unsigned count = 1;
        if (field->arity == SARN_ARITY_MULTI) {
          count = FieldAccess::Count(frame.pObjectM, *field);
        } else if (field->arity == SARN_ARITY_OPTIONAL && !IsFieldPresent(frame.pObjectM, *field)) {
          continue;
        }
        unsigned first = FirstValue(frame.pObjectM, *field, 0, count);
        if (first == count) continue;
        StartField(visitor, frame, field, n, FieldName(info, *field), first, count);
        return FIELD_STARTED;
      }
    }
    return FIELD_NONE;
  }

  enum Step { STEP_DESCEND, STEP_DONE, STEP_FAILED };

  // Visits the values of `frame`, field after field, until one is a schema object to descend
  // into (then in `child`), the frame has nothing left, or the visitor stops. Values that are not
  // objects never leave this loop, so they cost no trip through the stack.
  Step Advance(Visitor& visitor, Frame& frame, Child& child) {
    for (;;) {
      if (frame.pFieldM == nullptr) {
        if (frame.isOneFieldM) return STEP_DONE;
        FieldStep next = NextField(visitor, frame);
        if (next == FIELD_NONE) return STEP_DONE;
        if (next == FIELD_FAILED) return STEP_FAILED;
      }
      const FieldInfo& field = *frame.pFieldM;
      const bool isNullAbsent = !kIsPaired && TraitsOf(field.dataType).IsNullAbsent();
      for (unsigned i = frame.nextElementM; i < frame.nElementM; ++i) {
        if (isNullAbsent && FieldAccess::ReferenceAt(frame.pObjectM, field, i) == nullptr) continue;
        if (!visitor.Value(frame, i, child)) return STEP_FAILED;
        if (child.pObjectM != nullptr) {
          frame.nextElementM = i + 1;
          return STEP_DESCEND;
        }
      }
      if constexpr (!kIsPaired) visitor.EndField(frame);
      frame.pFieldM = nullptr;
    }
  }

  bool Walk(Visitor& visitor) {
    while (!stackM.Empty()) {
      Frame& frame = stackM.Top();
      Child child;
      Step step = Advance(visitor, frame, child);
      if (step == STEP_FAILED) return Fail(child);
      if (step == STEP_DONE) {
        if (frame.isOneFieldM) {
          *pOneFieldDataM = frame.dataM;
        } else {
          visitor.EndObject(frame);
          Release(frame);
        }
        stackM.Pop();
        continue;
      }
      Frame* next = stackM.Push();
      if (next == nullptr) return Fail(child);
      next->pObjectM = child.pObjectM;
      next->pInfoM = InfoOf(child.pObjectM);
      next->versionM = child.versionM;
      next->isOwnedM = child.isOwnedM;
      next->dataM = child.dataM;
      visitor.BeginObject(*next, &stackM.At(stackM.Count() - 2));
    }
    return true;
  }

  static void Release(Frame& frame) {
    if (frame.isOwnedM) const_cast<SarnObject*>(frame.pObjectM)->DownRef();
  }

  bool Fail(Child& child) {
    if (child.isOwnedM && child.pObjectM != nullptr) const_cast<SarnObject*>(child.pObjectM)->DownRef();
    while (!stackM.Empty()) {
      Release(stackM.Top());
      stackM.Pop();
    }
    return false;
  }

  WalkStack<Frame> stackM;
  const StructInfo* const* pStructDefsM;
  uint32_t nStructDefsM;
  Data* pOneFieldDataM = nullptr;
};

}  // namespace internal
}  // namespace sarn
