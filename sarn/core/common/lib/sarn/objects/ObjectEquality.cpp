// Equality of schema objects: the comparison rules of each data type, and the visitor that runs
// them over two objects walked side by side (the paired form of the one object walk). Nested
// objects are descended by the walk, never by recursion here, so depth costs no C stack; the
// comparisons of single values call back into operator== only through SingleFieldEquals and
// MultiFieldEquals used on their own.
#include <cstdint>
#include <cstring>

#include "sarn/dict/Dict.h"
#include "sarn/dict/LazyDict.h"
#include "sarn/model/FieldAccess.h"
#include "sarn/model/SarnObject.h"
#include "sarn/model/Schema.h"
#include "sarn/model/internal/ObjectWalk.h"
#include "sarn/values/ScalarTypes.h"
#include "vek/VekArray.h"

namespace sarn {
namespace {

template <class T>
T Load(const void* p) {
  T value;
  std::memcpy(&value, p, sizeof value);
  return value;
}

// One scalar of `dataType` at `a` and at `b`, both of the width the data type gives.
bool ScalarEquals(unsigned dataType, const void* a, const void* b) {
  switch (dataType) {
    case SARN_DATA_TYPE_BOOL:
      return Load<uint8_t>(a) == Load<uint8_t>(b);
    case SARN_DATA_TYPE_CHANNEL_NUMBER:
      return Load<ChannelNumber>(a) == Load<ChannelNumber>(b);
    case SARN_DATA_TYPE_CURRENCY:
      return Load<Currency>(a) == Load<Currency>(b);
    case SARN_DATA_TYPE_DATE:
    case SARN_DATA_TYPE_TIME:
    case SARN_DATA_TYPE_INT_ID:
    case SARN_DATA_TYPE_S32:
    case SARN_DATA_TYPE_U32:
      return Load<uint32_t>(a) == Load<uint32_t>(b);
    case SARN_DATA_TYPE_DATETIME:
    case SARN_DATA_TYPE_LONG_ID:
    case SARN_DATA_TYPE_S64:
    case SARN_DATA_TYPE_U64:
      return Load<uint64_t>(a) == Load<uint64_t>(b);
    case SARN_DATA_TYPE_ENUM:
      // Numbers are 16-bit in every form the service sends; the upper half is not part of it.
      return (Load<uint32_t>(a) & 0xFFFFu) == (Load<uint32_t>(b) & 0xFFFFu);
    case SARN_DATA_TYPE_FLOAT:
      return Load<double>(a) == Load<double>(b);
    default:
      return false;
  }
}

// Two references of `dataType`: two nulls are equal, a null and a value are not (byte strings are
// never equal, null or not).
bool ReferenceEquals(unsigned dataType, const VekCore* a, const VekCore* b) {
  if (dataType == SARN_DATA_TYPE_BYTESTRING) return false;
  if (a == nullptr || b == nullptr) return a == b;
  switch (dataType) {
    case SARN_DATA_TYPE_ANY_DICT:
      return *static_cast<const Dict*>(a) == *static_cast<const Dict*>(b);
    case SARN_DATA_TYPE_KNOWN_DICT:
    case SARN_DATA_TYPE_SUBDICT:
      return *static_cast<const SarnObject*>(a) == *static_cast<const SarnObject*>(b);
    case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY:
      return *static_cast<const LazyDict*>(a) == *static_cast<const LazyDict*>(b);
    default:
      return false;
  }
}

// A scalar element of width `width` widened to 64 bits, for arrays whose width is not their data
// type's.
uint64_t Widen(const void* p, int width) {
  switch (width) {
    case 1:
      return Load<uint8_t>(p);
    case 4:
      return Load<uint32_t>(p);
    default:
      return Load<uint64_t>(p);
  }
}

bool ScalarArraysEqual(unsigned dataType, const VekGenericIntArray& a, const VekGenericIntArray& b, unsigned count) {
  const int width = TraitsOf(dataType).width;
  if (a.GetWidth() == width && b.GetWidth() == width) {
    // Equal bytes are equal values for every type but these two (NaN, -0.0; the upper enum half).
    if (dataType != SARN_DATA_TYPE_FLOAT && dataType != SARN_DATA_TYPE_ENUM) {
      return std::memcmp(a.Get(0), b.Get(0), static_cast<size_t>(count) * static_cast<size_t>(width)) == 0;
    }
    for (unsigned i = 0; i < count; ++i) {
      if (!ScalarEquals(dataType, a.Get(static_cast<int>(i)), b.Get(static_cast<int>(i)))) return false;
    }
    return true;
  }
  // An array built with another width: each side is read with its own and compared as an integer
  // of the data type; values that are not integers (FLOAT, CHANNEL_NUMBER, CURRENCY) have no other
  // width to be read in.
  if (dataType == SARN_DATA_TYPE_FLOAT || dataType == SARN_DATA_TYPE_CHANNEL_NUMBER ||
      dataType == SARN_DATA_TYPE_CURRENCY) {
    return false;
  }
  for (unsigned i = 0; i < count; ++i) {
    uint64_t x = Widen(a.Get(static_cast<int>(i)), a.GetWidth());
    uint64_t y = Widen(b.Get(static_cast<int>(i)), b.GetWidth());
    if (!ScalarEquals(dataType, &x, &y)) return false;
  }
  return true;
}

bool IsDescended(unsigned dataType) {
  return dataType == SARN_DATA_TYPE_KNOWN_DICT || dataType == SARN_DATA_TYPE_SUBDICT;
}

struct PairData {
  const SarnObject* pOtherM;  // the right-hand object of the frame
};

// The paired walk's visitor: fields of values are settled by the two static rules; fields of
// objects are descended by the walk, one pair of elements at a time.
class EqualityVisitor {
 public:
  static constexpr bool kIsPaired = true;
  using FrameData = PairData;
  using Walk = internal::ObjectWalk<EqualityVisitor, internal::WalkVersions::CURRENT_RECORDS>;
  using Frame = Walk::Frame;
  using Child = Walk::Child;

  void BeginObject(Frame&, Frame*) {}
  void EndObject(Frame&) {}

  internal::PairStep PairField(Frame& frame, const FieldInfo& field) {
    SarnObject* a = const_cast<SarnObject*>(frame.pObjectM);
    SarnObject* b = const_cast<SarnObject*>(frame.dataM.pOtherM);
    switch (field.arity) {
      case SARN_ARITY_OPTIONAL: {
        const bool isPresent = IsFieldPresent(a, field);
        if (isPresent != IsFieldPresent(b, field)) return internal::PAIR_STOP;
        if (!isPresent) return internal::PAIR_SKIP;
        [[fallthrough]];
      }
      case SARN_ARITY_REQUIRED:
        if (IsDescended(field.dataType)) return internal::PAIR_VISIT;
        return Settle(SarnObject::SingleFieldEquals(&field, FieldStorage(a, field), FieldStorage(b, field)));
      case SARN_ARITY_MULTI:
        if (IsDescended(field.dataType)) {
          unsigned count = FieldAccess::Count(a, field);
          if (count != FieldAccess::Count(b, field)) return internal::PAIR_STOP;
          return count == 0 ? internal::PAIR_SKIP : internal::PAIR_VISIT;
        }
        return Settle(SarnObject::MultiFieldEquals(&field, FieldStorage(a, field), FieldStorage(b, field)));
      default:
        return internal::PAIR_SKIP;
    }
  }

  bool Value(Frame& frame, unsigned i, Child& child) {
    const FieldInfo& field = *frame.pFieldM;
    const VekCore* a = FieldAccess::ReferenceAt(frame.pObjectM, field, i);
    const VekCore* b = FieldAccess::ReferenceAt(frame.dataM.pOtherM, field, i);
    if (a == nullptr || b == nullptr) return a == b;
    const SarnObject* left = static_cast<const SarnObject*>(a);
    const SarnObject* right = static_cast<const SarnObject*>(b);
    if (left->typeIdM != right->typeIdM) return false;
    child.pObjectM = left;
    child.dataM.pOtherM = right;
    return true;
  }

 private:
  static internal::PairStep Settle(bool isEqual) { return isEqual ? internal::PAIR_SKIP : internal::PAIR_STOP; }
};

}  // namespace

bool SarnObject::operator==(const SarnObject& other) const {
  if (typeIdM != other.typeIdM) return false;
  EqualityVisitor visitor;
  EqualityVisitor::Walk walk(GetMempool(), Schema::vStructDefG, static_cast<uint32_t>(Schema::nStructDefG));
  return walk.Run(visitor, this, 0, PairData{&other});
}

bool SarnObject::SingleFieldEquals(const FieldInfo* field, void* a, void* b) {
  const unsigned dataType = field->dataType;
  switch (TraitsOf(dataType).storage) {
    case DataTypeTraits::STORAGE_SCALAR:
      return ScalarEquals(dataType, a, b);
    case DataTypeTraits::STORAGE_STRING:
      return *static_cast<const VekString*>(a) == *static_cast<const VekString*>(b);
    case DataTypeTraits::STORAGE_REFERENCE:
      return ReferenceEquals(dataType, Load<const VekCore*>(a), Load<const VekCore*>(b));
    default:
      return false;
  }
}

bool SarnObject::MultiFieldEquals(const FieldInfo* field, void* a, void* b) {
  const unsigned dataType = field->dataType;
  switch (TraitsOf(dataType).storage) {
    case DataTypeTraits::STORAGE_SCALAR: {
      const auto& left = *static_cast<const VekGenericIntArray*>(a);
      const auto& right = *static_cast<const VekGenericIntArray*>(b);
      if (left.Count() != right.Count()) return false;
      return left.Count() == 0 || ScalarArraysEqual(dataType, left, right, left.Count());
    }
    case DataTypeTraits::STORAGE_STRING: {
      const auto& left = *static_cast<const VekStringArray*>(a);
      const auto& right = *static_cast<const VekStringArray*>(b);
      if (left.Count() != right.Count()) return false;
      for (unsigned i = 0; i < left.Count(); ++i) {
        if (left.Get(static_cast<int>(i)) != right.Get(static_cast<int>(i))) return false;
      }
      return true;
    }
    case DataTypeTraits::STORAGE_REFERENCE: {
      if (dataType == SARN_DATA_TYPE_BYTESTRING) return false;
      const auto& left = *static_cast<const VekGenericArray*>(a);
      const auto& right = *static_cast<const VekGenericArray*>(b);
      if (left.Count() != right.Count()) return false;
      for (unsigned i = 0; i < left.Count(); ++i) {
        if (!ReferenceEquals(dataType, left.Get(static_cast<int>(i)), right.Get(static_cast<int>(i)))) return false;
      }
      return true;
    }
    default:
      return false;
  }
}

}  // namespace sarn
