// Writes the C++ of a resolved schema: one header per class, an umbrella header, a fixed number of
// translation units holding the classes' tables and members, one for the registry and one for the
// enums. The output is deterministic (ids in order, no dates), so an unchanged schema rewrites
// nothing and triggers no rebuild.
//
// Everything the generated code names outside its own namespace is written fully qualified, so a
// schema type whose class name equals a runtime or platform name cannot capture it.
#include "SchemaEmitter.h"

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <sstream>

namespace schemagen {
namespace {

const char kBanner[] = "// generated: do not edit. Produced by schemagen from the schema description.\n";

std::string Hex4(int value) {
  char buffer[8];
  std::snprintf(buffer, sizeof buffer, "0x%04X", value & 0xFFFF);
  return buffer;
}

int TypeBits(const Record& r) { return (r.flagOffset << 7) | (r.arity << 5) | r.dataType; }

std::string RecordInitializer(const Record& r, int nameOffset) {
  std::ostringstream out;
  out << "{" << r.minVersion << ", " << r.maxVersion << ", {" << Hex4(TypeBits(r)) << "}, " << r.valueOffset << ", "
      << r.refIndex << ", " << nameOffset << ", 0}";
  return out.str();
}

const char kPlaceholder[] = "{0, 0, {0x0075}, 0, 0, 0, 0}";

// A C string literal of bytes that are all printable identifiers or NULs (checked by the resolver).
std::string Literal(const std::string& bytes) {
  std::string out = "\"";
  for (char c : bytes) {
    if (c == '\0') {
      out += "\\000";
    } else {
      out += c;
    }
  }
  return out + "\"";
}

std::string MemberType(const Record& r) {
  if (r.arity != AR_MULTI) return GetDataTypeInfo(r.dataType).cppType;
  switch (r.dataType) {
    case DT_STRING:
    case DT_STRING_ID:
      return "::VekStringArray";
    case DT_BYTESTRING:
    case DT_ANY_DICT:
    case DT_KNOWN_DICT:
    case DT_KNOWN_DICT_AS_LAZY:
    case DT_SUBDICT:
      return "::VekGenericArray";
    default:
      return "::VekGenericIntArray";
  }
}

std::string MemberInit(const Record& r) {
  if (r.arity != AR_MULTI) return r.memberName + "()";
  std::string type = MemberType(r);
  if (type == "::VekStringArray") return r.memberName + "(GetMempool())";
  if (type == "::VekGenericArray") return r.memberName + "(GetMempool(), 3)";
  return r.memberName + "(" + std::to_string(GetDataTypeInfo(r.dataType).multiWidth) + ", GetMempool(), 3)";
}

// All records of a type in layout order (by offset).
std::vector<const Record*> LayoutOrder(const Type& type, bool flags) {
  std::vector<const Record*> records;
  for (const Field& field : type.fields) {
    for (const Record& older : field.older) records.push_back(&older);
    records.push_back(&field.current);
  }
  std::vector<const Record*> result;
  for (const Record* r : records) {
    if (!flags || r->flagOffset != 0) result.push_back(r);
  }
  std::sort(result.begin(), result.end(), [flags](const Record* a, const Record* b) {
    return flags ? a->flagOffset < b->flagOffset : a->valueOffset < b->valueOffset;
  });
  return result;
}

std::string Describe(const Record& r, const std::string& target) {
  std::string text = GetDataTypeInfo(r.dataType).keyword;
  if (!target.empty()) text += "(" + target + ")";
  text += std::string(" ") + ArityKeyword(r.arity) + " " + std::to_string(r.minVersion) + "-" + std::to_string(r.maxVersion);
  return text;
}

class Emitter {
 public:
  Emitter(const Schema& schema, const std::string& outDir, int units) : schemaM(schema), dirM(outDir + "/schema"), unitsM(units) {}

  bool Run(std::string& error) {
    std::error_code ec;
    std::filesystem::create_directories(dirM, ec);
    if (ec) {
      error = "cannot create " + dirM + ": " + ec.message();
      return false;
    }
    for (const Type& type : schemaM.types) Write(type.className + ".h", ClassHeader(type));
    Write("sarn-schema.h", Umbrella());
    size_t perUnit = (schemaM.types.size() + unitsM - 1) / unitsM;
    for (int unit = 0; unit < unitsM; ++unit) {
      size_t begin = std::min(schemaM.types.size(), unit * perUnit);
      size_t end = std::min(schemaM.types.size(), begin + perUnit);
      Write("schema-types-" + std::to_string(unit) + ".cpp", TypesUnit(begin, end));
    }
    Write("schema-registry.cpp", Registry());
    Write("schema-enums.cpp", Enums());
    error = errorM;
    return errorM.empty();
  }

 private:
  void Write(const std::string& name, const std::string& text) {
    std::string path = dirM + "/" + name;
    std::ifstream in(path, std::ios::binary);
    if (in) {
      std::ostringstream old;
      old << in.rdbuf();
      if (old.str() == text) return;
    }
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out << text;
    if (!out.good() && errorM.empty()) errorM = "cannot write " + path;
  }

  std::string ClassHeader(const Type& type) {
    std::ostringstream out;
    out << kBanner << "// Schema type '" << type.name << "' (id " << type.id << ").\n#pragma once\n\n"
        << "#include \"sarn/objects/GeneratedSupport.h\"\n\nnamespace sarnschema {\n\n"
        << "class SARN_EXPORT " << type.className << " : public ::sarn::SarnObject {\n public:\n"
        << "  static constexpr uint32_t TYPE_ID = " << type.id << ";\n"
        << "  " << type.className << "();\n"
        << "  ~" << type.className << "() override;\n"
        << "  // A default object in `pool` with its first reference; null when the pool is exhausted.\n"
        << "  static ::ref<::sarn::SarnObject> Factory(::VekMempool* pool);\n"
        << "  void SetDebugLockOwner(::VekLockId id) override;\n\n"
        << "  static ::sarn::StructInfo structInfoG;\n"
        << "  static const ::sarn::FieldInfo vFieldInfoG[" << type.nFieldInfo << "];\n"
        << "  static const ::sarn::FieldInfoHistory vFieldInfoHistoryG[" << type.nFieldInfo << "];\n"
        << "  static const char* const pFieldNamesG;\n";
    std::vector<const Record*> flags = LayoutOrder(type, true);
    if (!flags.empty()) out << "\n";
    for (const Record* r : flags) out << "  bool " << r->flagMemberName << ";  // byte " << r->flagOffset << "\n";
    out << "\n";
    for (const Record* r : LayoutOrder(type, false)) {
      out << "  " << MemberType(*r) << " " << r->memberName << ";  // byte " << r->valueOffset << ": "
          << Describe(*r, TargetName(*r)) << "\n";
    }
    out << "};\n\n}  // namespace sarnschema\n";
    return out.str();
  }

  std::string TargetName(const Record& r) const {
    return r.refIndex == 0 ? std::string() : r.target;
  }

  std::string Umbrella() {
    std::ostringstream out;
    out << kBanner << "// Every generated schema class.\n#pragma once\n\n";
    for (const Type& type : schemaM.types) out << "#include \"schema/" << type.className << ".h\"\n";
    return out.str();
  }

  std::string TypesUnit(size_t begin, size_t end) {
    std::ostringstream out;
    out << kBanner << "#include <cstddef>\n\n#include \"sarn/objects/GeneratedSupport.h\"\n";
    for (size_t i = begin; i < end; ++i) out << "#include \"schema/" << schemaM.types[i].className << ".h\"\n";
    out << "\n// The layout checks below compare the generator's offsets with the compiler's.\n"
        << "#pragma GCC diagnostic ignored \"-Winvalid-offsetof\"\n\nnamespace sarnschema {\n";
    for (size_t i = begin; i < end; ++i) TypeDefinitions(out, schemaM.types[i]);
    out << "\n}  // namespace sarnschema\n";
    return out.str();
  }

  void TypeDefinitions(std::ostringstream& out, const Type& type) {
    const std::string& c = type.className;
    out << "\n// " << type.name << " (" << type.id << ")\n";
    out << "namespace {\nconst char kNames" << c << "[] = " << Literal(type.namePool) << ";\n";
    bool hasHistory = false;
    for (const Field& field : type.fields) {
      if (field.older.empty()) continue;
      hasHistory = true;
      out << "const ::sarn::FieldInfo kOlder" << c << "_" << field.number << "[" << field.older.size() << "] = {";
      for (const Record& older : field.older) out << "\n    " << RecordInitializer(older, field.nameOffset) << ",";
      out << "};\n";
    }
    out << "}  // namespace\n";

    out << "const ::sarn::FieldInfo " << c << "::vFieldInfoG[" << type.nFieldInfo << "] = {\n    " << kPlaceholder << ",\n";
    int next = 1;
    for (const Field& field : type.fields) {
      for (; next < field.number; ++next) out << "    " << kPlaceholder << ",\n";
      out << "    " << RecordInitializer(field.current, field.nameOffset) << ",  // " << field.number << " " << field.name << "\n";
      next = field.number + 1;
    }
    out << "};\n";
    out << "const ::sarn::FieldInfoHistory " << c << "::vFieldInfoHistoryG[" << type.nFieldInfo << "] = {";
    if (hasHistory) {
      int number = 0;
      for (const Field& field : type.fields) {
        if (field.older.empty()) continue;
        for (; number < field.number; ++number) out << "{0, nullptr}, ";
        out << "{" << field.older.size() << ", kOlder" << c << "_" << field.number << "}, ";
        number = field.number + 1;
      }
    }
    out << "};\n";
    out << "const char* const " << c << "::pFieldNamesG = kNames" << c << ";\n";
    // The name pool is linked here by constant initialisation, so no static initialiser of any
    // other translation unit can observe the record without it.
    out << "::sarn::StructInfo " << c << "::structInfoG = {\"" << type.name << "\", "
        << (type.hasPrefix ? "\"" + type.prefix + "\"" : std::string("nullptr")) << ", " << type.nFieldInfo << ", " << c
        << "::vFieldInfoG, " << c << "::vFieldInfoHistoryG, kNames" << c << ", &" << c << "::Factory};\n";

    out << c << "::" << c << "() : ::sarn::SarnObject(" << type.id << ")";
    for (const Record* r : LayoutOrder(type, true)) out << ",\n    " << r->flagMemberName << "(false)";
    for (const Record* r : LayoutOrder(type, false)) out << ",\n    " << MemberInit(*r);
    out << " {}\n";
    out << c << "::~" << c << "() {}\n";
    out << "::ref<::sarn::SarnObject> " << c << "::Factory(::VekMempool* pool) { return ::sarn::NewSchemaObject<" << c
        << ">(pool); }\n";
    out << "void " << c << "::SetDebugLockOwner(::VekLockId id) {\n  ::sarn::SarnObject::SetDebugLockOwner(id);\n";
    for (const Record* r : LayoutOrder(type, false)) {
      if (MemberType(*r) == "::VekStringArray") out << "  " << r->memberName << ".SetDebugLockOwner(id);\n";
    }
    out << "}\n";
    out << "static_assert(sizeof(" << c << ") == " << type.objectSize << ", \"" << c << " size\");\n";
    for (const Record* r : LayoutOrder(type, true)) {
      out << "static_assert(offsetof(" << c << ", " << r->flagMemberName << ") == " << r->flagOffset << ", \"\");\n";
    }
    for (const Record* r : LayoutOrder(type, false)) {
      out << "static_assert(offsetof(" << c << ", " << r->memberName << ") == " << r->valueOffset << ", \"\");\n";
    }
  }

  // A pointer table with one entry per slot, eight to a line.
  template <class Entry>
  void PointerTable(std::ostringstream& out, int size, Entry entry) {
    for (int i = 0; i < size; ++i) {
      out << (i % 8 == 0 ? "\n    " : " ") << entry(i) << ",";
    }
    out << "\n};\n";
  }

  std::string Registry() {
    std::ostringstream out;
    out << kBanner << "// The registry tables: types by id and by name, and the version range.\n"
        << "#include \"sarn/objects/GeneratedSupport.h\"\n#include \"schema/sarn-schema.h\"\n\nnamespace sarn {\n\n";
    std::vector<int> byId(schemaM.nStructDef, -1);
    for (size_t i = 0; i < schemaM.types.size(); ++i) byId[schemaM.types[i].id] = static_cast<int>(i);
    auto slot = [this](int index) {
      return index < 0 ? std::string("nullptr") : "&::sarnschema::" + schemaM.types[index].className + "::structInfoG";
    };
    out << "const StructInfo* const Schema::vStructDefG[" << schemaM.nStructDef << "] = {";
    PointerTable(out, schemaM.nStructDef, [&](int i) { return slot(byId[i]); });
    out << "const int Schema::nStructDefG = " << schemaM.nStructDef << ";\n";
    out << "const StructInfo* const Schema::structNameHashTableG[" << schemaM.nameTableSize << "] = {";
    PointerTable(out, schemaM.nameTableSize, [&](int i) { return slot(schemaM.nameTable[i]); });
    out << "const int Schema::structNameHashTableSizeG = " << schemaM.nameTableSize << ";\n";
    out << "const int Schema::firstSchemaVersionG = " << schemaM.firstVersion << ";\n";
    out << "const int Schema::lastSchemaVersionG = " << schemaM.lastVersion << ";\n";
    out << "const int Schema::defaultSchemaVersionG = " << schemaM.defaultVersion << ";\n";
    out << "const int Schema::nStructTypeG = " << schemaM.types.size() << ";\n";
    out << "const int Schema::nEnumTypeG = " << schemaM.enums.size() << ";\n";
    out << "\n}  // namespace sarn\n";
    return out.str();
  }

  std::string Enums() {
    std::ostringstream out;
    out << kBanner << "// The enum definitions: names by number, enums by id.\n"
        << "#include \"sarn/model/Schema.h\"\n\nnamespace sarn {\nnamespace {\n";
    std::vector<int> byId(schemaM.nEnumDef, -1);
    for (size_t i = 0; i < schemaM.enums.size(); ++i) {
      const Enum& e = schemaM.enums[i];
      byId[e.id] = static_cast<int>(i);
      out << "\n// " << e.name << "\n";
      if (!e.names.empty()) {
        out << "const char* const kEnumNames" << e.id << "[" << e.names.size() << "] = {";
        PointerTable(out, static_cast<int>(e.names.size()), [&](int n) {
          return e.used[n] ? "\"" + e.names[n] + "\"" : std::string("nullptr");
        });
      }
      out << "const EnumDef kEnum" << e.id << " = {" << e.names.size() << "u, "
          << (e.names.empty() ? std::string("nullptr") : "kEnumNames" + std::to_string(e.id)) << "};\n";
    }
    out << "\n}  // namespace\n\nconst EnumDef* const Schema::vEnumDefG[" << schemaM.nEnumDef << "] = {";
    PointerTable(out, schemaM.nEnumDef, [&](int i) {
      return byId[i] < 0 ? std::string("nullptr") : "&kEnum" + std::to_string(i);
    });
    out << "const int Schema::nEnumDefG = " << schemaM.nEnumDef << ";\n\n}  // namespace sarn\n";
    return out.str();
  }

  const Schema& schemaM;
  std::string dirM;
  int unitsM;
  std::string errorM;
};

}  // namespace

bool EmitSchema(const Schema& schema, const std::string& outDir, int units, std::string& error) {
  return Emitter(schema, outDir, units).Run(error);
}

}  // namespace schemagen
