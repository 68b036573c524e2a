// sarn schema: the registry as text. Every type by id, one type's fields with their history, or
// one enum's values; a name that is not found gets the closest names as suggestions.
#include <algorithm>
#include <cctype>
#include <cstring>
#include <string>
#include <vector>

#include "Cli.h"
#include "Objects.h"

namespace sarncli {
namespace {

const char kHelp[] =
    "Usage: sarn schema [TYPE|ID] [--enum ID|TYPE.FIELD] [-o FILE]\n"
    "Prints the schema compiled into the library.\n"
    "\n"
    "  (no argument)        every type as \"ID<TAB>NAME\", by id\n"
    "  TYPE|ID              the type's fields by number: NUMBER, NAME, DATA TYPE, ARITY,\n"
    "                       FIRST-LAST version and the type or enum it refers to; each older\n"
    "                       record of a field follows it, indented\n"
    "  --enum ID|TYPE.FIELD the numbers and names of an enum, given by its id or by a field\n"
    "  -o FILE              write to FILE instead of standard output\n"
    "\n"
    "A name that is not found is reported with the closest names (status 1).\n";

bool IsNumber(const std::string& text) {
  return !text.empty() && text.size() < 10 && text.find_first_not_of("0123456789") == std::string::npos;
}

const sarn::StructInfo* FindType(Context& context, const std::string& word, long& id) {
  const sarn::StructInfo* info =
      IsNumber(word) ? sarn::StructInfoForId(std::stol(word)) : sarn::StructInfoMap::LookupStructByName(word.c_str());
  if (info == nullptr) {
    context.Report(word, IsNumber(word) ? "no type with id " + word : NotFoundMessage("type", word, TypeNames()),
                   STATUS_INVALID);
    return nullptr;
  }
  for (id = 0; sarn::Schema::vStructDefG[id] != info; ++id) {
  }
  return info;
}

// NAME, DATA TYPE, ARITY, FIRST-LAST and the referred type or enum of one record.
std::string Record(const sarn::StructInfo* info, const sarn::FieldInfo& field) {
  std::string text = std::string(sarn::FieldName(info, field)) + "\t" + DataTypeName(field.dataType) + "\t" +
                     ArityName(field.arity) + "\t" + std::to_string(field.minVersion) + "-" +
                     std::to_string(field.maxVersion);
  if (field.dataType == sarn::SARN_DATA_TYPE_ENUM) {
    text += "\tenum " + std::to_string(field.refIndex);
  } else if (field.refIndex != 0) {
    const sarn::StructInfo* target = sarn::StructInfoForId(field.refIndex);
    text += "\t" + std::string(target != nullptr ? target->pName : "?") + " (" + std::to_string(field.refIndex) + ")";
  }
  return text + "\n";
}

std::string Fields(const sarn::StructInfo* info, long id) {
  std::string text = std::to_string(id) + "\t" + info->pName;
  if (info->pIdPrefix != nullptr) text += std::string("\tid prefix ") + info->pIdPrefix;
  text += "\n";
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const sarn::FieldInfo& field = info->vFieldInfo[n];
    if (field.dataType == sarn::SARN_DATA_TYPE_PLACEHOLDER) continue;
    text += std::to_string(n) + "\t" + Record(info, field);
    const sarn::FieldInfoHistory& history = info->vFieldInfoHistory[n];
    for (uint32_t k = 0; k < history.nFieldInfo; ++k) text += "  \t" + Record(info, history.vFieldInfo[k]);
  }
  return text;
}

// The enum named by an id or by TYPE.FIELD; -1 after reporting why there is none.
long FindEnum(Context& context, const std::string& word) {
  if (IsNumber(word)) {
    if (sarn::EnumDefForId(std::stol(word)) != nullptr) return std::stol(word);
    context.Report(word, "no enum with id " + word, STATUS_INVALID);
    return -1;
  }
  size_t dot = word.find('.');
  if (dot == std::string::npos) {
    context.UsageError("--enum takes an enum id or TYPE.FIELD, not '" + word + "'");
    return -1;
  }
  long typeId;
  const sarn::StructInfo* info = FindType(context, word.substr(0, dot), typeId);
  if (info == nullptr) return -1;
  std::string fieldName = word.substr(dot + 1);
  std::vector<std::string> names;
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const sarn::FieldInfo& field = info->vFieldInfo[n];
    if (field.dataType == sarn::SARN_DATA_TYPE_PLACEHOLDER) continue;
    if (fieldName == sarn::FieldName(info, field)) {
      if (field.dataType == sarn::SARN_DATA_TYPE_ENUM) return field.refIndex;
      context.Report(word, "the field is of data type " + std::string(DataTypeName(field.dataType)) + ", not ENUM",
                     STATUS_INVALID);
      return -1;
    }
    names.push_back(sarn::FieldName(info, field));
  }
  context.Report(word, NotFoundMessage("field", fieldName, names), STATUS_INVALID);
  return -1;
}

int Main(Context& context) {
  context.Valued("--enum");
  if (!context.Parse() || context.isHelpM) return context.GetStatus();
  if (context.positionalM.size() > 1 || (context.positionalM.size() == 1 && context.Has("--enum"))) {
    return context.UsageError("give one type, or one enum with --enum");
  }
  std::string text;
  if (context.Has("--enum")) {
    long enumId = FindEnum(context, context.Value("--enum"));
    if (enumId < 0) return context.GetStatus();
    const sarn::EnumDef* def = sarn::EnumDefForId(enumId);
    text = "enum " + std::to_string(enumId) + "\n";
    for (uint64_t n = 0; n < def->nValue; ++n) {
      if (def->vName[n] != nullptr) text += std::to_string(n) + "\t" + def->vName[n] + "\n";
    }
  } else if (context.positionalM.size() == 1) {
    long id;
    const sarn::StructInfo* info = FindType(context, context.positionalM[0], id);
    if (info == nullptr) return context.GetStatus();
    text = Fields(info, id);
  } else {
    for (int id = 0; id < sarn::Schema::nStructDefG; ++id) {
      if (const sarn::StructInfo* info = sarn::Schema::vStructDefG[id]) {
        text += std::to_string(id) + "\t" + info->pName + "\n";
      }
    }
  }
  if (!context.OpenOutput()) return context.GetStatus();
  context.Write(text);
  return context.GetStatus();
}

}  // namespace

const Command kSchemaCommand = {"schema", "list the schema's types, one type's fields, or an enum", kHelp, Main};

}  // namespace sarncli
