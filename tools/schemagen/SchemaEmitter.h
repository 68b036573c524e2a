// Output of the schema generator: the C++ sources of a resolved schema, and a readable dump of its
// tables (record bytes, offsets, names) that tests compare with golden files.
#pragma once

#include <ostream>
#include <string>
#include <vector>

#include "SchemaModel.h"

namespace schemagen {

// Writes <outDir>/schema/: one header per class, sarn-schema.h (all of them), `units` translation
// units of class code and tables, schema-registry.cpp and schema-enums.cpp. Files whose contents
// are unchanged are left alone. False (with `error`) when a file cannot be written.
bool EmitSchema(const Schema& schema, const std::string& outDir, int units, std::string& error);

// Writes every table of the resolved schema as text: one line per record with its twelve bytes.
void DumpSchema(const Schema& schema, std::ostream& out);

// Writes a proto2 mirror of the listed types (by schema name) and of every type their sub-objects
// refer to. False (with `error`) when a name is not a type of the schema.
bool EmitProto(const Schema& schema, const std::vector<std::string>& typeNames, std::ostream& out,
               std::string& error);

}  // namespace schemagen
