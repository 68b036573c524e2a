// The text dump of a resolved schema: what the generated tables hold, byte for byte, in a form a
// person can review in a golden file.
#include <cstdio>

#include "SchemaEmitter.h"

namespace schemagen {
namespace {

void RecordBytes(std::ostream& out, const Record& r, int nameOffset) {
  int typeBits = (r.flagOffset << 7) | (r.arity << 5) | r.dataType;
  const int bytes[12] = {r.minVersion, r.maxVersion, typeBits & 0xFF, typeBits >> 8, r.valueOffset & 0xFF, r.valueOffset >> 8,
                         r.refIndex & 0xFF, r.refIndex >> 8, nameOffset & 0xFF, nameOffset >> 8, 0, 0};
  char buffer[4];
  for (int i = 0; i < 12; ++i) {
    std::snprintf(buffer, sizeof buffer, "%02x", bytes[i] & 0xFF);
    out << (i == 0 ? "" : " ") << buffer;
  }
}

void RecordText(std::ostream& out, const Record& r) {
  out << "  " << GetDataTypeInfo(r.dataType).keyword << " " << ArityKeyword(r.arity) << " " << r.minVersion << "-"
      << r.maxVersion;
  if (r.flagOffset != 0) out << " flag " << r.flagOffset << " " << r.flagMemberName;
  out << " value " << r.valueOffset << " " << r.memberName;
  if (r.refIndex != 0) out << " ref " << r.refIndex;
  out << "\n";
}

}  // namespace

void DumpSchema(const Schema& schema, std::ostream& out) {
  out << "versions " << schema.firstVersion << "-" << schema.lastVersion << " default " << schema.defaultVersion << "\n";
  out << "types " << schema.types.size() << " in " << schema.nStructDef << " slots, enums " << schema.enums.size() << " in "
      << schema.nEnumDef << " slots\n";
  for (const Type& type : schema.types) {
    out << "\ntype " << type.id << " " << type.name << " class " << type.className << " prefix "
        << (type.hasPrefix ? type.prefix : "-") << " size " << type.objectSize << " nFieldInfo " << type.nFieldInfo << "\n";
    out << "  names";
    for (const Field& field : type.fields) out << " " << field.nameOffset << ":" << field.name;
    out << "\n";
    out << "  0 00 00 75 00 00 00 00 00 00 00 00 00 placeholder\n";
    int next = 1;
    for (const Field& field : type.fields) {
      for (; next < field.number; ++next) out << "  " << next << " 00 00 75 00 00 00 00 00 00 00 00 00 placeholder\n";
      next = field.number + 1;
      out << "  " << field.number << " ";
      RecordBytes(out, field.current, field.nameOffset);
      out << " " << field.name << "\n";
      RecordText(out, field.current);
      for (const Record& older : field.older) {
        out << "    older ";
        RecordBytes(out, older, field.nameOffset);
        out << "\n  ";
        RecordText(out, older);
      }
    }
  }
  for (const Enum& e : schema.enums) {
    out << "\nenum " << e.id << " " << e.name << " nValue " << e.names.size() << ":";
    for (size_t n = 0; n < e.names.size(); ++n) {
      if (e.used[n]) out << " " << n << "=" << e.names[n];
    }
    out << "\n";
  }
  out << "\nname-table " << schema.nameTableSize << " slots, at most " << schema.maxProbes << " probes:";
  for (size_t slot = 0; slot < schema.nameTable.size(); ++slot) {
    if (schema.nameTable[slot] >= 0) out << " " << slot << "=" << schema.types[schema.nameTable[slot]].name;
  }
  out << "\n";
}

}  // namespace schemagen
