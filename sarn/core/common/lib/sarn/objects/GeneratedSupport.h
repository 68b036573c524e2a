// GeneratedSupport: the one runtime header that the generated schema code includes. It brings in
// every type a generated member can have and the helper the generated factories share.
//
// Generated code (schema/<Class>.h, schema/sarn-schema.h and the schema-*.cpp units in the build
// tree) is produced by tools/schemagen from the schema description named by SARN_SCHEMA_FILE. A
// generated class holds data only: public members at the offsets its FieldInfo records give, a
// constructor that sets the defaults, a destructor that releases what the object holds, a
// factory and SetDebugLockOwner. All behaviour lives in the runtime's walkers.
//
// Ownership: a factory's object belongs to the pool it names and to whoever holds references.
// Thread safety: the tables are constant after loading; objects are not locked.
#pragma once

#include <cstddef>
#include <cstdint>
#include <new>

#include "sarn/dict/Dict.h"
#include "sarn/base/Export.h"
#include "sarn/dict/LazyDict.h"
#include "sarn/model/SarnObject.h"
#include "sarn/values/ScalarTypes.h"
#include "sarn/model/Schema.h"
#include "vek/VekArray.h"
#include "vek/VekByteString.h"
#include "vek/VekCore.h"
#include "vek/VekString.h"


namespace sarn {

// The body of every generated Factory: the object in `pool` (the platform's counted new records
// the pool), with its first reference. Null when the pool cannot supply the bytes: the counted new
// does not throw, and a generated constructor allocates nothing (its arrays take storage on
// their first Add).
template <class T>
ref<SarnObject> NewSchemaObject(VekMempool* pool) {
  return ref<SarnObject>(new (pool) T());
}

}  // namespace sarn
