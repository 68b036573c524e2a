// Reads the schema description, a line-oriented text meant for people:
//
//   # comment (anywhere; to the end of the line)
//   versions 7 42                  first and last schema version
//   default-version 42             (optional; default: the last version)
//   name-table 3532                (optional; slots of the struct-name table)
//   enum levelOfDetail 714         enum NAME ID [size N] [type-names]
//     0 low                        one line per value: NUMBER NAME
//   end
//   type address 191 prefix vask:ds.
//     1 addressId longId(address) optional        NUMBER NAME DATATYPE[(TARGET)] ARITY [FIRST-LAST]
//     3 assetId longId(asset) required 13-42
//       older longId(asset) optional 7-12         an older record of the field above
//   end
//
// The parser checks the shape of each line; names, ids and numbers are checked together in
// SchemaLayout.cpp once the whole file is read (references may point forward).
#include <cctype>
#include <cstdio>
#include <sstream>

#include "SchemaModel.h"

namespace schemagen {
namespace {

std::vector<std::string> SplitWords(const std::string& line) {
  std::vector<std::string> words;
  std::string cleaned = line.substr(0, line.find('#'));
  std::istringstream in(cleaned);
  std::string word;
  while (in >> word) words.push_back(word);
  return words;
}

// Accepts decimal digits only, capped so that absurd values stay representable and are then
// refused by the range checks.
bool ParseNumber(const std::string& text, int64_t& value) {
  if (text.empty() || text.size() > 12) return false;
  value = 0;
  for (char c : text) {
    if (c < '0' || c > '9') return false;
    value = value * 10 + (c - '0');
  }
  return true;
}

class Parser {
 public:
  Parser(Schema& schema, std::vector<Diagnostic>& errors) : schemaM(schema), errorsM(errors) {}

  void Run(const std::string& text) {
    std::istringstream in(text);
    std::string line;
    int lineNo = 0;
    while (std::getline(in, line)) {
      ++lineNo;
      std::vector<std::string> words = SplitWords(line);
      if (words.empty()) continue;
      lineM = lineNo;
      if (inTypeM) {
        TypeLine(words);
      } else if (inEnumM) {
        EnumLine(words);
      } else {
        TopLine(words);
      }
    }
    if (inTypeM) Error(schemaM.types.back().line, "missing 'end' of type '" + schemaM.types.back().name + "'");
    if (inEnumM) Error(schemaM.enums.back().line, "missing 'end' of enum '" + schemaM.enums.back().name + "'");
  }

 private:
  void Error(int line, const std::string& message) { errorsM.push_back({line, message}); }
  void Error(const std::string& message) { Error(lineM, message); }

  bool Number(const std::string& text, int64_t& value) {
    if (ParseNumber(text, value)) return true;
    Error("'" + text + "' is not a number");
    return false;
  }

  bool Version(const std::string& text, int& version) {
    int64_t value;
    if (!Number(text, value)) return false;
    if (value > 255) {
      Error("version " + text + " is outside 0-255");
      return false;
    }
    version = static_cast<int>(value);
    return true;
  }

  bool VersionRange(const std::string& text, Record& record) {
    size_t dash = text.find('-');
    if (dash == std::string::npos) {
      Error("version range '" + text + "' is not of the form first-last");
      return false;
    }
    if (!Version(text.substr(0, dash), record.minVersion) || !Version(text.substr(dash + 1), record.maxVersion)) {
      return false;
    }
    if (record.minVersion > record.maxVersion) {
      Error("version range " + text + " is empty");
      return false;
    }
    return true;
  }

  void TopLine(const std::vector<std::string>& w) {
    const std::string& keyword = w[0];
    if (keyword == "versions" && w.size() == 3) {
      Version(w[1], schemaM.firstVersion);
      Version(w[2], schemaM.lastVersion);
      if (schemaM.firstVersion > schemaM.lastVersion) Error("version range " + w[1] + "-" + w[2] + " is empty");
    } else if (keyword == "default-version" && w.size() == 2) {
      Version(w[1], schemaM.defaultVersion);
      schemaM.defaultVersionLine = lineM;
    } else if (keyword == "name-table" && w.size() == 2) {
      int64_t size;
      if (Number(w[1], size)) {
        if (size < 1 || size > 1000000) {
          Error("name-table size " + w[1] + " is outside 1-1000000");
        } else {
          schemaM.nameTableSize = static_cast<int>(size);
          schemaM.nameTableLine = lineM;
        }
      }
    } else if (keyword == "type" && (w.size() == 3 || (w.size() == 5 && w[3] == "prefix"))) {
      Type type;
      type.line = lineM;
      type.name = w[1];
      int64_t id = -1;  // -1: already reported
      if (!Number(w[2], id)) id = -1;
      type.id = static_cast<int>(id > 0x7fffffff ? 0x7fffffff : id);
      if (w.size() == 5) {
        type.hasPrefix = true;
        type.prefix = w[4];
      }
      schemaM.types.push_back(type);
      inTypeM = true;
    } else if (keyword == "enum" && w.size() >= 3) {
      Enum e;
      e.line = lineM;
      e.name = w[1];
      int64_t id = -1;
      if (!Number(w[2], id)) id = -1;
      e.id = static_cast<int>(id > 0x7fffffff ? 0x7fffffff : id);
      for (size_t i = 3; i < w.size(); ++i) {
        if (w[i] == "size" && i + 1 < w.size()) {
          Number(w[++i], e.size);
        } else if (w[i] == "type-names") {
          e.typeNames = true;
        } else {
          Error("unexpected '" + w[i] + "' in enum header (size N, type-names)");
        }
      }
      schemaM.enums.push_back(e);
      inEnumM = true;
    } else if (keyword == "end") {
      Error("'end' outside a type or enum");
    } else if (keyword == "versions") {
      Error("expected: versions FIRST LAST");
    } else if (keyword == "default-version") {
      Error("expected: default-version VERSION");
    } else if (keyword == "name-table") {
      Error("expected: name-table SLOTS");
    } else if (keyword == "type") {
      Error("expected: type NAME ID [prefix PREFIX]");
    } else if (keyword == "enum") {
      Error("expected: enum NAME ID [size N] [type-names]");
    } else {
      Error("unknown statement '" + keyword + "'");
    }
  }

  bool DataTypeWord(const std::string& word, Record& record) {
    std::string keyword = word;
    size_t open = word.find('(');
    if (open != std::string::npos) {
      if (word.back() != ')' || open + 2 > word.size() - 1) {
        Error("data type '" + word + "' is not of the form type(target)");
        return false;
      }
      keyword = word.substr(0, open);
      record.target = word.substr(open + 1, word.size() - open - 2);
    }
    record.dataType = DataTypeFromKeyword(keyword);
    if (record.dataType < 0) {
      Error("unknown data type '" + keyword + "'");
      return false;
    }
    return true;
  }

  bool ArityWord(const std::string& word, Record& record) {
    for (int arity = AR_OPTIONAL; arity <= AR_MULTI; ++arity) {
      if (word == ArityKeyword(arity)) {
        record.arity = arity;
        return true;
      }
    }
    Error("unknown arity '" + word + "' (optional, required or multi)");
    return false;
  }

  void TypeLine(const std::vector<std::string>& w) {
    Type& type = schemaM.types.back();
    if (w[0] == "end" && w.size() == 1) {
      type.endLine = lineM;
      inTypeM = false;
      return;
    }
    Record record;
    record.line = lineM;
    record.minVersion = -1;
    record.maxVersion = -1;
    if (w[0] == "older") {
      if (w.size() != 4) {
        Error("expected: older DATATYPE ARITY FIRST-LAST");
        return;
      }
      if (type.fields.empty()) {
        Error("'older' must follow a field");
        return;
      }
      if (DataTypeWord(w[1], record) && ArityWord(w[2], record) && VersionRange(w[3], record)) {
        type.fields.back().older.push_back(record);
      }
      return;
    }
    if (w.size() != 4 && w.size() != 5) {
      Error("expected: NUMBER NAME DATATYPE ARITY [FIRST-LAST], or 'end'");
      return;
    }
    Field field;
    field.line = lineM;
    int64_t number;
    if (!Number(w[0], number)) return;
    field.number = static_cast<int>(number > 0x7fffffff ? 0x7fffffff : number);
    field.name = w[1];
    if (!DataTypeWord(w[2], record) || !ArityWord(w[3], record)) return;
    if (w.size() == 5 && !VersionRange(w[4], record)) return;
    field.current = record;
    type.fields.push_back(field);
  }

  void EnumLine(const std::vector<std::string>& w) {
    Enum& e = schemaM.enums.back();
    if (w[0] == "end" && w.size() == 1) {
      inEnumM = false;
      return;
    }
    if (w.size() != 2) {
      Error("expected: NUMBER NAME, or 'end'");
      return;
    }
    EnumValue value;
    value.line = lineM;
    if (!Number(w[0], value.number)) return;
    value.name = w[1];
    e.values.push_back(value);
  }

  Schema& schemaM;
  std::vector<Diagnostic>& errorsM;
  int lineM = 0;
  bool inTypeM = false;
  bool inEnumM = false;
};

}  // namespace

void ParseSchema(const std::string& text, Schema& schema, std::vector<Diagnostic>& errors) {
  Parser(schema, errors).Run(text);
}

}  // namespace schemagen
