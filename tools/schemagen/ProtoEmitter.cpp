// A proto2 mirror of part of the schema, for peers that read and write the binary form with a
// protocol-buffer library: the listed types and every type their sub-objects refer to.
//
// Each field keeps its number; single fields are `optional` and MULTI fields `repeated` (never
// packed, which is proto2's default). Known dicts become a KnownDict message with one field per
// listed type, numbered by its type id; free-form dictionaries the three AnyDict messages of their
// entry/name/value parts.
#include <map>
#include <ostream>
#include <set>
#include <string>
#include <vector>

#include "SchemaEmitter.h"

namespace schemagen {

namespace {

const char* ScalarProtoType(int dataType) {
  switch (dataType) {
    case DT_S32:
    case DT_DATE:
      return "sint32";
    case DT_S64:
    case DT_DATETIME:
      return "sint64";
    case DT_ENUM:
    case DT_TIME:
    case DT_INT_ID:
    case DT_U32:
      return "uint32";
    case DT_LONG_ID:
    case DT_U64:
      return "uint64";
    case DT_FLOAT:
      return "double";
    case DT_BOOL:
      return "bool";
    case DT_BYTESTRING:
      return "bytes";
    case DT_ANY_DICT:
      return "AnyDict";
    case DT_KNOWN_DICT:
    case DT_KNOWN_DICT_AS_LAZY:
      return "KnownDict";
    default:
      return "string";  // STRING, STRING_ID, CHANNEL_NUMBER, CURRENCY
  }
}

}  // namespace

bool EmitProto(const Schema& schema, const std::vector<std::string>& typeNames, std::ostream& out,
               std::string& error) {
  std::map<std::string, const Type*> byName;
  std::map<int, const Type*> byId;
  for (const Type& type : schema.types) {
    byName[type.name] = &type;
    byId[type.id] = &type;
  }
  std::vector<const Type*> listed;
  for (const std::string& name : typeNames) {
    auto found = byName.find(name);
    if (found == byName.end()) {
      error = "no type named '" + name + "' in the schema";
      return false;
    }
    listed.push_back(found->second);
  }
  // The closure over sub-object references, in id order so that the output is stable.
  std::set<int> closure;
  std::vector<const Type*> pending(listed.begin(), listed.end());
  while (!pending.empty()) {
    const Type* type = pending.back();
    pending.pop_back();
    if (!closure.insert(type->id).second) continue;
    for (const Field& field : type->fields) {
      if (field.current.dataType == DT_SUBDICT) pending.push_back(byId.at(field.current.refIndex));
    }
  }

  out << "// generated: do not edit. Produced by schemagen --proto from the schema description.\n"
      << "syntax = \"proto2\";\n\npackage sarnmirror;\n\n"
      << "message AnyDict {\n  repeated AnyDictEntry entries = 4;\n}\n\n"
      << "message AnyDictEntry {\n  optional string name = 6;\n  repeated AnyDictValue values = 8;\n}\n\n"
      << "// A string value, or a nested dictionary's entries.\n"
      << "message AnyDictValue {\n  optional string text = 2;\n  repeated AnyDictEntry entries = 4;\n}\n\n"
      << "// An object that names its own type: the field of its type id.\n"
      << "message KnownDict {\n";
  std::set<int> listedIds;
  for (const Type* type : listed) listedIds.insert(type->id);
  for (int id : listedIds) out << "  optional " << byId.at(id)->className << " " << byId.at(id)->name << " = " << id << ";\n";
  out << "}\n";
  for (int id : closure) {
    const Type* type = byId.at(id);
    out << "\n// " << type->name << " (type id " << type->id << ")\nmessage " << type->className << " {\n";
    for (const Field& field : type->fields) {
      const Record& record = field.current;
      const char* label = record.arity == AR_MULTI ? "repeated" : "optional";
      std::string protoType =
          record.dataType == DT_SUBDICT ? byId.at(record.refIndex)->className : ScalarProtoType(record.dataType);
      out << "  " << label << " " << protoType << " " << field.name << " = " << field.number << ";\n";
    }
    out << "}\n";
  }
  return true;
}

}  // namespace schemagen
