// Interim empty registry so that the library links before the generated tables arrive; it is
// removed when the generator's output is added to the library.
#include "sarn/Schema.h"

namespace sarn {

const StructInfo* const Schema::vStructDefG[1] = {nullptr};
const int Schema::nStructDefG = 1;
const EnumDef* const Schema::vEnumDefG[1] = {nullptr};
const int Schema::nEnumDefG = 1;
const StructInfo* const Schema::structNameHashTableG[1] = {nullptr};
const int Schema::structNameHashTableSizeG = 1;
const int Schema::firstSchemaVersionG = 7;
const int Schema::lastSchemaVersionG = 42;
const int Schema::defaultSchemaVersionG = 42;
const int Schema::nStructTypeG = 0;
const int Schema::nEnumTypeG = 0;

}  // namespace sarn
