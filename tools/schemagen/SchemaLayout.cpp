// Checks a parsed schema as a whole and derives everything the emitters write: resolved
// references, field tables with placeholders, the object layout, name pools, enum name tables and
// the struct-name table.
//
// Every check here protects either the record formats (ids and offsets are 16 bits, flag offsets
// 9 bits, versions 8 bits) or the generated C++ (names become identifiers and members), so that a
// schema that passes always compiles and always describes itself correctly.
#include <algorithm>
#include <cctype>
#include <cstring>
#include <map>
#include <set>

#include "SchemaModel.h"

namespace schemagen {
namespace {

// size, align: one value in the object; multi fields are one 24-byte platform array instead.
const DataTypeInfo kDataTypes[DT_COUNT] = {
    {"bool", TARGET_NONE, 1, 1, true, "bool", 1},
    {"bytestring", TARGET_NONE, 8, 8, false, "::ref<::vek::ByteBuffer>", 0},
    {"channelNumber", TARGET_NONE, 8, 4, true, "::sarn::ChannelNumber", 8},
    {"currency", TARGET_NONE, 8, 4, true, "::sarn::Currency", 8},
    {"date", TARGET_NONE, 4, 4, true, "::sarn::Date", 4},
    {"dateTime", TARGET_NONE, 8, 8, true, "::sarn::DateTime", 8},
    {"anyDict", TARGET_NONE, 8, 8, false, "::ref<::sarn::Dict>", 0},
    {"enum", TARGET_ENUM, 4, 4, true, "uint32_t", 4},
    {"float", TARGET_NONE, 8, 8, true, "double", 8},
    {"intId", TARGET_OPTIONAL_TYPE, 4, 4, true, "uint32_t", 4},
    {"longId", TARGET_OPTIONAL_TYPE, 8, 8, true, "uint64_t", 8},
    {"stringId", TARGET_OPTIONAL_TYPE, 8, 8, true, "::VekString", 0},
    {"knownDict", TARGET_NONE, 8, 8, false, "::ref<::sarn::SarnObject>", 0},
    {"knownDictAsLazy", TARGET_NONE, 8, 8, false, "::ref<::sarn::LazyDict>", 0},
    {"subdict", TARGET_TYPE, 8, 8, false, "::ref<::sarn::SarnObject>", 0},
    {"s64", TARGET_NONE, 8, 8, true, "int64_t", 8},
    {"s32", TARGET_NONE, 4, 4, true, "int32_t", 4},
    {"string", TARGET_NONE, 8, 8, true, "::VekString", 0},
    {"time", TARGET_NONE, 4, 4, true, "::sarn::Time", 4},
    {"u32", TARGET_NONE, 4, 4, true, "uint32_t", 4},
    {"u64", TARGET_NONE, 8, 8, true, "uint64_t", 8},
};

constexpr int kObjectHeaderBytes = 24;   // VekCore part and the type id
constexpr int kMaxFlagOffset = 511;      // 9 bits of typeBits
constexpr int kMaxObjectBytes = 65528;   // valueOffset is 16 bits; sizes are multiples of 8
constexpr int kMaxId = 65535;            // refIndex is 16 bits
constexpr int kMaxFieldNumber = 65534;   // nFieldInfo is 16 bits
constexpr int64_t kMaxEnumNumber = 65535;
constexpr int kArrayBytes = 24;

bool IsIdentifier(const std::string& name, bool lowerFirst) {
  if (name.empty() || name.size() > 200) return false;
  unsigned char first = static_cast<unsigned char>(name[0]);
  if (lowerFirst ? !std::islower(first) : !(std::isalpha(first) || first == '_')) return false;
  for (char c : name) {
    if (!std::isalnum(static_cast<unsigned char>(c)) && c != '_') return false;
  }
  return true;
}

std::string Capitalized(const std::string& name) {
  std::string result = name;
  result[0] = static_cast<char>(std::toupper(static_cast<unsigned char>(result[0])));
  return result;
}

// Class names that would clash with members every schema class has (its own or inherited).
bool IsReservedClassName(const std::string& name) {
  static const char* const kReserved[] = {
      "Factory", "SetDebugLockOwner", "GetTypeName", "GetTypeId", "GetStructInfo", "SarnObject", "VekCore",
      "GetMempool", "UpRef", "DownRef", "GetRefCount", "ZoCastHelper", "ToDictionary", "ToDict", "ToString",
      "Clone", "SingleFieldEquals", "MultiFieldEquals"};
  for (const char* reserved : kReserved) {
    if (name == reserved) return true;
  }
  return false;
}

int AlignUp(int value, int align) { return (value + align - 1) / align * align; }

class Resolver {
 public:
  Resolver(Schema& schema, std::vector<Diagnostic>& errors) : schemaM(schema), errorsM(errors) {}

  void Run() {
    if (schemaM.defaultVersion < 0) schemaM.defaultVersion = schemaM.lastVersion;
    if (schemaM.defaultVersion < schemaM.firstVersion || schemaM.defaultVersion > schemaM.lastVersion) {
      Error(schemaM.defaultVersionLine, "default version " + std::to_string(schemaM.defaultVersion) + " is outside the versions " +
                   std::to_string(schemaM.firstVersion) + "-" + std::to_string(schemaM.lastVersion));
    }
    CheckTypes();
    CheckEnums();
    for (Type& type : schemaM.types) ResolveType(type);
    if (!errorsM.empty()) return;
    std::sort(schemaM.types.begin(), schemaM.types.end(), [](const Type& a, const Type& b) { return a.id < b.id; });
    std::sort(schemaM.enums.begin(), schemaM.enums.end(), [](const Enum& a, const Enum& b) { return a.id < b.id; });
    for (Enum& e : schemaM.enums) BuildEnumNames(e);
    if (!errorsM.empty()) return;
    schemaM.nStructDef = schemaM.types.empty() ? 1 : schemaM.types.back().id + 1;
    schemaM.nEnumDef = schemaM.enums.empty() ? 1 : schemaM.enums.back().id + 1;
    BuildNameTable();
  }

 private:
  void Error(int line, const std::string& message) { errorsM.push_back({line, message}); }

  void CheckTypes() {
    std::map<int, const Type*> byId;
    std::map<std::string, const Type*> byName;
    std::map<std::string, const Type*> byFoldedName;  // headers are named after classes
    for (Type& type : schemaM.types) {
      if (!IsIdentifier(type.name, true)) {
        Error(type.line, "type name '" + type.name + "' is not an identifier starting with a lower-case letter");
      } else {
        type.className = Capitalized(type.name);
        bool allCapitals = type.className.size() >= 2 && std::none_of(type.className.begin(), type.className.end(),
                                        [](char c) { return std::islower(static_cast<unsigned char>(c)); });
        if (allCapitals) Error(type.line, "type name '" + type.name + "' would give the all-capitals class name '" + type.className + "'");
        if (IsReservedClassName(type.className)) {
          Error(type.line, "type name '" + type.name + "' would give the class name '" + type.className + "', which names a member of every schema class");
        }
        std::string folded = type.name;
        for (char& c : folded) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
        auto sameFolded = byFoldedName.find(folded);
        if (sameFolded != byFoldedName.end() && sameFolded->second->name != type.name) {
          Error(type.line, "type names '" + sameFolded->second->name + "' and '" + type.name + "' differ only in case");
        } else {
          byFoldedName[folded] = &type;
        }
      }
      if (type.id != -1 && (type.id < 1 || type.id > kMaxId)) {
        Error(type.line, "type id " + std::to_string(type.id) + " is outside 1-" + std::to_string(kMaxId));
      } else if (type.id != -1) {
        auto found = byId.find(type.id);
        if (found != byId.end()) {
          Error(type.line, "duplicate type id " + std::to_string(type.id) + " (also type '" + found->second->name +
                               "' at line " + std::to_string(found->second->line) + ")");
        } else {
          byId[type.id] = &type;
        }
      }
      auto sameName = byName.find(type.name);
      if (sameName != byName.end()) {
        Error(type.line, "duplicate type name '" + type.name + "' (also at line " + std::to_string(sameName->second->line) + ")");
      } else {
        byName[type.name] = &type;
      }
      if (type.hasPrefix) {
        bool printable = !type.prefix.empty() && type.prefix.size() <= 100 &&
                         std::all_of(type.prefix.begin(), type.prefix.end(), [](char c) {
                           return c > ' ' && c < 127 && c != '"' && c != '\\' && c != '?';
                         });
        if (!printable) Error(type.line, "prefix '" + type.prefix + "' must be 1-100 printable characters without quotes, backslashes or '?'");
      }
    }
    for (const auto& entry : byName) typesByNameM[entry.first] = entry.second->id;
    for (const auto& entry : byId) typeIdsM.insert(entry.first);
  }

  void CheckEnums() {
    std::map<int, const Enum*> byId;
    std::map<std::string, const Enum*> byName;
    for (Enum& e : schemaM.enums) {
      if (!IsIdentifier(e.name, false)) Error(e.line, "enum name '" + e.name + "' is not an identifier");
      if (e.id != -1 && (e.id < 1 || e.id > kMaxId)) {
        Error(e.line, "enum id " + std::to_string(e.id) + " is outside 1-" + std::to_string(kMaxId));
      } else if (e.id != -1) {
        auto found = byId.find(e.id);
        if (found != byId.end()) {
          Error(e.line, "duplicate enum id " + std::to_string(e.id) + " (also enum '" + found->second->name + "' at line " +
                            std::to_string(found->second->line) + ")");
        } else if (typeIdsM.count(e.id) != 0) {
          Error(e.line, "enum id " + std::to_string(e.id) + " is already a type id");
        } else {
          byId[e.id] = &e;
        }
      }
      auto sameName = byName.find(e.name);
      if (sameName != byName.end()) {
        Error(e.line, "duplicate enum name '" + e.name + "' (also at line " + std::to_string(sameName->second->line) + ")");
      } else {
        byName[e.name] = &e;
      }
      if (e.size != -1 && (e.size < 0 || e.size > kMaxEnumNumber + 1)) {
        Error(e.line, "enum size " + std::to_string(e.size) + " is outside 0-" + std::to_string(kMaxEnumNumber + 1));
      }
      std::map<int64_t, const EnumValue*> numbers;
      std::map<std::string, const EnumValue*> names;
      for (const EnumValue& value : e.values) {
        if (value.number > kMaxEnumNumber) {
          Error(value.line, "enum number " + std::to_string(value.number) + " is outside 0-" + std::to_string(kMaxEnumNumber));
          continue;
        }
        if (!IsIdentifier(value.name, false)) Error(value.line, "enum value name '" + value.name + "' is not an identifier");
        auto number = numbers.find(value.number);
        if (number != numbers.end()) {
          Error(value.line, "duplicate number " + std::to_string(value.number) + " in enum '" + e.name + "' (also '" +
                                number->second->name + "' at line " + std::to_string(number->second->line) + ")");
        }
        numbers[value.number] = &value;
        auto name = names.find(value.name);
        if (name != names.end()) {
          Error(value.line, "duplicate value name '" + value.name + "' in enum '" + e.name + "' (also at line " +
                                std::to_string(name->second->line) + ")");
        }
        names[value.name] = &value;
        if (e.typeNames && typeIdsM.count(static_cast<int>(value.number)) != 0) {
          Error(value.line, "number " + std::to_string(value.number) + " of enum '" + e.name + "' is taken by a type name");
        }
      }
    }
    for (const auto& entry : byName) enumsByNameM[entry.first] = entry.second->id;
  }

  void ResolveRecord(const Type& type, const std::string& fieldName, Record& record) {
    if (record.minVersion < 0) {
      record.minVersion = schemaM.firstVersion;
      record.maxVersion = schemaM.lastVersion;
    }
    const DataTypeInfo& info = kDataTypes[record.dataType];
    const std::string where = " (field '" + fieldName + "' of type '" + type.name + "')";
    if (record.dataType == DT_KNOWN_DICT_AS_LAZY && record.arity != AR_REQUIRED) {
      Error(record.line, "knownDictAsLazy field '" + fieldName + "' must be required");
    }
    if (info.target == TARGET_NONE) {
      if (!record.target.empty()) Error(record.line, std::string("data type '") + info.keyword + "' takes no target" + where);
      return;
    }
    if (record.target.empty()) {
      if (info.target == TARGET_TYPE) Error(record.line, std::string("data type '") + info.keyword + "' needs a target type" + where);
      if (info.target == TARGET_ENUM) Error(record.line, std::string("data type '") + info.keyword + "' needs a target enum" + where);
      return;
    }
    if (info.target == TARGET_ENUM) {
      auto found = enumsByNameM.find(record.target);
      if (found == enumsByNameM.end()) {
        Error(record.line, "unknown enum '" + record.target + "'" + where);
      } else {
        record.refIndex = found->second;
      }
    } else {
      auto found = typesByNameM.find(record.target);
      if (found == typesByNameM.end()) {
        Error(record.line, "unknown type '" + record.target + "'" + where);
      } else {
        record.refIndex = found->second;
      }
    }
  }

  void ResolveType(Type& type) {
    std::map<int, const Field*> numbers;
    std::map<std::string, const Field*> names;
    for (Field& field : type.fields) {
      if (field.number < 1 || field.number > kMaxFieldNumber) {
        Error(field.line, "field number " + std::to_string(field.number) + " is outside 1-" + std::to_string(kMaxFieldNumber));
      } else {
        auto found = numbers.find(field.number);
        if (found != numbers.end()) {
          Error(field.line, "duplicate field number " + std::to_string(field.number) + " in type '" + type.name + "' (also '" +
                                found->second->name + "' at line " + std::to_string(found->second->line) + ")");
        }
        numbers[field.number] = &field;
      }
      if (!IsIdentifier(field.name, true)) {
        Error(field.line, "field name '" + field.name + "' is not an identifier starting with a lower-case letter");
      }
      // Every text form of an object carries its type name under the key "type", so a field of
      // that name would be written twice and read back as the type name.
      if (field.name == "type") {
        Error(field.line, "field name 'type' is reserved for the type name in the text forms");
      }
      auto sameName = names.find(field.name);
      if (sameName != names.end()) {
        Error(field.line, "duplicate field name '" + field.name + "' in type '" + type.name + "' (also at line " +
                              std::to_string(sameName->second->line) + ")");
      }
      names[field.name] = &field;
      ResolveRecord(type, field.name, field.current);
      for (Record& older : field.older) ResolveRecord(type, field.name, older);
      CheckOverlaps(field);
    }
    std::stable_sort(type.fields.begin(), type.fields.end(), [](const Field& a, const Field& b) { return a.number < b.number; });
    // Duplicate names were reported already; their members would only be reported again.
    Layout(type, names.size() == type.fields.size());
  }

  // Two records of one field may not cover the same version: the history rule would silently
  // prefer one of them.
  void CheckOverlaps(Field& field) {
    std::sort(field.older.begin(), field.older.end(), [](const Record& a, const Record& b) { return a.maxVersion < b.maxVersion; });
    std::vector<const Record*> all;
    for (const Record& older : field.older) all.push_back(&older);
    all.push_back(&field.current);
    for (size_t i = 0; i < all.size(); ++i) {
      for (size_t j = i + 1; j < all.size(); ++j) {
        if (all[i]->minVersion <= all[j]->maxVersion && all[j]->minVersion <= all[i]->maxVersion) {
          const Record* later = all[i]->line > all[j]->line ? all[i] : all[j];
          Error(later->line, "versions " + std::to_string(all[i]->minVersion) + "-" + std::to_string(all[i]->maxVersion) + " and " +
                                 std::to_string(all[j]->minVersion) + "-" + std::to_string(all[j]->maxVersion) +
                                 " of field '" + field.name + "' overlap");
        }
      }
    }
  }

  struct Slot {
    std::string name;
    int order;  // older records (by maxVersion) before the current one
    Record* record;
  };

  void Layout(Type& type, bool checkMembers) {
    std::vector<Slot> slots;
    for (Field& field : type.fields) {
      for (size_t i = 0; i < field.older.size(); ++i) {
        Record& older = field.older[i];
        older.memberName = field.name + "UpTo" + std::to_string(older.maxVersion) + "M";
        slots.push_back({field.name, static_cast<int>(i), &older});
      }
      field.current.memberName = field.name + "M";
      slots.push_back({field.name, static_cast<int>(field.older.size()), &field.current});
    }
    // Flags and values both follow the byte order of the field names.
    std::sort(slots.begin(), slots.end(), [](const Slot& a, const Slot& b) {
      int c = std::strcmp(a.name.c_str(), b.name.c_str());
      return c != 0 ? c < 0 : a.order < b.order;
    });
    std::set<std::string> members;
    int offset = kObjectHeaderBytes;
    for (Slot& slot : slots) {
      Record& r = *slot.record;
      if (r.arity != AR_OPTIONAL || !kDataTypes[r.dataType].hasFlag) continue;
      r.flagMemberName = "fHas" + Capitalized(r.memberName);
      r.flagOffset = offset++;
      if (!members.insert(r.flagMemberName).second && checkMembers) {
        Error(r.line, "member '" + r.flagMemberName + "' of type '" + type.name + "' would be declared twice");
      }
    }
    if (offset - 1 > kMaxFlagOffset) {
      Error(type.line, "type '" + type.name + "' has " + std::to_string(offset - kObjectHeaderBytes) + " presence flags; at most " +
                           std::to_string(kMaxFlagOffset + 1 - kObjectHeaderBytes) + " fit");
    }
    for (Slot& slot : slots) {
      Record& r = *slot.record;
      int size = r.arity == AR_MULTI ? kArrayBytes : kDataTypes[r.dataType].size;
      int align = r.arity == AR_MULTI ? 8 : kDataTypes[r.dataType].align;
      offset = AlignUp(offset, align);
      r.valueOffset = offset;
      offset += size;
      if (!members.insert(r.memberName).second && checkMembers) {
        Error(r.line, "member '" + r.memberName + "' of type '" + type.name + "' would be declared twice");
      }
    }
    type.objectSize = AlignUp(offset, 8);
    if (type.objectSize > kMaxObjectBytes) {
      Error(type.line, "type '" + type.name + "' needs " + std::to_string(type.objectSize) + " bytes; objects are limited to " +
                           std::to_string(kMaxObjectBytes));
    }
    type.nFieldInfo = type.fields.empty() ? 1 : type.fields.back().number + 1;
    type.namePool.clear();
    for (Field& field : type.fields) {
      field.nameOffset = static_cast<int>(type.namePool.size());
      type.namePool += field.name;
      type.namePool.push_back('\0');
    }
    if (!type.fields.empty() && type.fields.back().nameOffset > 65535) {
      Error(type.line, "the field names of type '" + type.name + "' exceed 65535 bytes");
    }
  }

  void BuildEnumNames(Enum& e) {
    int64_t count = 0;
    for (const EnumValue& value : e.values) count = std::max(count, value.number + 1);
    if (e.typeNames) {
      for (const Type& type : schemaM.types) count = std::max<int64_t>(count, type.id + 1);
    }
    if (e.size >= 0) {
      if (e.size < count) {
        Error(e.line, "enum '" + e.name + "' has size " + std::to_string(e.size) + " but numbers up to " + std::to_string(count - 1));
        return;
      }
      count = e.size;
    }
    e.names.assign(static_cast<size_t>(count), std::string());
    e.used.assign(static_cast<size_t>(count), false);
    for (const EnumValue& value : e.values) {
      e.names[value.number] = value.name;
      e.used[value.number] = true;
    }
    if (e.typeNames) {
      for (const Type& type : schemaM.types) {
        e.names[type.id] = type.name;
        e.used[type.id] = true;
      }
    }
  }

  void BuildNameTable() {
    const int nTypes = static_cast<int>(schemaM.types.size());
    int size = schemaM.nameTableSize > 0 ? schemaM.nameTableSize : 3 * nTypes + 1;
    if (size <= nTypes) {
      Error(schemaM.nameTableLine, "name-table of " + std::to_string(size) + " slots is too small for " + std::to_string(nTypes) +
                   " types (a lookup must always meet an empty slot)");
      return;
    }
    schemaM.nameTableSize = size;
    schemaM.nameTable.assign(size, -1);
    schemaM.maxProbes = 0;
    for (int i = 0; i < nTypes; ++i) {
      uint32_t h = 0;
      for (unsigned char c : schemaM.types[i].name) h = h * 31u + c;
      uint32_t slot = h % static_cast<uint32_t>(size);
      int probes = 1;
      while (schemaM.nameTable[slot] != -1) {
        slot = slot + 1 == static_cast<uint32_t>(size) ? 0 : slot + 1;
        ++probes;
      }
      schemaM.nameTable[slot] = i;
      schemaM.maxProbes = std::max(schemaM.maxProbes, probes);
    }
  }

  Schema& schemaM;
  std::vector<Diagnostic>& errorsM;
  std::map<std::string, int> typesByNameM;
  std::map<std::string, int> enumsByNameM;
  std::set<int> typeIdsM;
};

}  // namespace

const DataTypeInfo& GetDataTypeInfo(int dataType) { return kDataTypes[dataType]; }

int DataTypeFromKeyword(const std::string& keyword) {
  for (int i = 0; i < DT_COUNT; ++i) {
    if (keyword == kDataTypes[i].keyword) return i;
  }
  return -1;
}

const char* ArityKeyword(int arity) {
  static const char* const kArities[] = {"optional", "required", "multi"};
  return kArities[arity];
}

void ResolveSchema(Schema& schema, std::vector<Diagnostic>& errors) { Resolver(schema, errors).Run(); }

}  // namespace schemagen
