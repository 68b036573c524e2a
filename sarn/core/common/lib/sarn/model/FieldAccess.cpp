// Stores and appends through a field's record. A single value is written in place (a reference by
// swapping the counted pointer, as ref<> assignment does); a multi-valued field goes through its
// platform array, which takes its own copy or reference.
#include "sarn/model/FieldAccess.h"

namespace sarn {

bool FieldAccess::PutString(SarnObject* object, const FieldInfo& field, const VekString& value) {
  if (field.arity == SARN_ARITY_MULTI) return FieldRef<VekStringArray>(object, field).Add(value);
  FieldRef<VekString>(object, field) = value;
  return true;
}

bool FieldAccess::PutString(SarnObject* object, const FieldInfo& field, VekString&& value) {
  if (field.arity == SARN_ARITY_MULTI) return FieldRef<VekStringArray>(object, field).Add(value);
  FieldRef<VekString>(object, field) = static_cast<VekString&&>(value);
  return true;
}

bool FieldAccess::PutReference(SarnObject* object, const FieldInfo& field, VekCore* value) {
  if (field.arity == SARN_ARITY_MULTI) return FieldRef<VekGenericArray>(object, field).Add(value);
  // The member is a ref<T> of some VekCore class: one pointer whose bits are the VekCore pointer.
  void* storage = FieldStorage(object, field);
  VekCore* old;
  std::memcpy(&old, storage, sizeof old);
  if (value != nullptr) value->UpRef();
  std::memcpy(storage, &value, sizeof value);
  if (old != nullptr) old->DownRef();
  return true;
}

}  // namespace sarn
