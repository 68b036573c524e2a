// The schema generator's in-memory model: what the schema description says (types, fields with
// their older records, enums), and what the generator derives from it (references resolved, the
// object layout, name pools, the struct-name table).
//
// The parser fills the "source" members; Resolve() (SchemaLayout.cpp) checks the whole schema and
// fills the "derived" members. The emitters and the dump only read a resolved schema.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace schemagen {

// Data type codes and arities as the runtime's FieldInfo stores them.
enum DataType {
  DT_BOOL = 0, DT_BYTESTRING, DT_CHANNEL_NUMBER, DT_CURRENCY, DT_DATE, DT_DATETIME, DT_ANY_DICT,
  DT_ENUM, DT_FLOAT, DT_INT_ID, DT_LONG_ID, DT_STRING_ID, DT_KNOWN_DICT, DT_KNOWN_DICT_AS_LAZY,
  DT_SUBDICT, DT_S64, DT_S32, DT_STRING, DT_TIME, DT_U32, DT_U64, DT_COUNT
};
enum Arity { AR_OPTIONAL = 0, AR_REQUIRED = 1, AR_MULTI = 2 };

// What a data type's target (the name in parentheses) refers to.
enum TargetKind { TARGET_NONE, TARGET_OPTIONAL_TYPE, TARGET_TYPE, TARGET_ENUM };

struct DataTypeInfo {
  const char* keyword;  // as written in the schema ("longId")
  TargetKind target;
  int size;             // bytes of one value in the object
  int align;
  bool hasFlag;         // an optional field of this type gets a presence-flag byte
  const char* cppType;  // member type of a single value
  int multiWidth;       // element width of the VekGenericIntArray of a multi field; 0 for others
};
const DataTypeInfo& GetDataTypeInfo(int dataType);
// The data type of a keyword, or -1.
int DataTypeFromKeyword(const std::string& keyword);
const char* ArityKeyword(int arity);

// One FieldInfo record: the current one of a field or an older one.
struct Record {
  int line = 0;
  int dataType = 0;
  int arity = 0;
  int minVersion = 0;
  int maxVersion = 0;
  std::string target;  // as written; empty when none
  // derived
  int refIndex = 0;
  int flagOffset = 0;  // 0: no flag byte
  int valueOffset = 0;
  std::string memberName;      // "assetIdUpTo12M"
  std::string flagMemberName;  // "fHasAssetIdUpTo12M" or empty
};

struct Field {
  int line = 0;
  int number = 0;
  std::string name;
  Record current;
  std::vector<Record> older;  // in the order written
  // derived
  int nameOffset = 0;
};

struct Type {
  int line = 0;
  int endLine = 0;
  std::string name;
  int id = 0;
  bool hasPrefix = false;
  std::string prefix;
  std::vector<Field> fields;  // in the order written; sorted by number after Resolve()
  // derived
  std::string className;
  int nFieldInfo = 0;
  int objectSize = 0;
  std::string namePool;  // names separated (and ended) by NUL
};

struct EnumValue {
  int line = 0;
  int64_t number = 0;
  std::string name;
};

struct Enum {
  int line = 0;
  std::string name;
  int id = 0;
  int64_t size = -1;        // "size N": nValue at least N
  bool typeNames = false;   // "type-names": every type's name at its id
  std::vector<EnumValue> values;
  // derived
  std::vector<std::string> names;  // index = number; empty string = unused
  std::vector<bool> used;
};

struct Schema {
  std::string file;  // as given on the command line (used in messages)
  int firstVersion = 7;
  int lastVersion = 42;
  int defaultVersion = -1;  // -1: the last version
  int nameTableSize = 0;    // 0: derived from the number of types
  int defaultVersionLine = 0;
  int nameTableLine = 0;
  std::vector<Type> types;  // in the order written; sorted by id after Resolve()
  std::vector<Enum> enums;  // sorted by id after Resolve()
  // derived
  int nStructDef = 0;  // highest type id + 1
  int nEnumDef = 0;    // highest enum id + 1 (at least 1)
  std::vector<int> nameTable;  // index into types, or -1
  int maxProbes = 0;
};

// A refusal: where and why.
struct Diagnostic {
  int line;
  std::string message;
};

// Parses `text` (the contents of schema.file) into `schema`; appends problems to `errors`.
void ParseSchema(const std::string& text, Schema& schema, std::vector<Diagnostic>& errors);
// Checks the parsed schema and derives layouts and tables; appends problems to `errors`.
void ResolveSchema(Schema& schema, std::vector<Diagnostic>& errors);
// Checks that a resolved schema carries the types the runtime names (the error object and the
// envelopes) with their ids and fields; needed only when code is generated for the library.
void CheckRuntimeTypes(const Schema& schema, std::vector<Diagnostic>& errors);

}  // namespace schemagen
