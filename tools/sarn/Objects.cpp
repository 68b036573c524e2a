#include "Objects.h"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstring>
#include <map>
#include <unordered_map>

namespace sarncli {
namespace {

// Edit distance (insertions, deletions, substitutions, swaps of neighbours), ignoring case.
size_t Distance(const std::string& a, const std::string& b) {
  std::vector<std::vector<size_t>> d(a.size() + 1, std::vector<size_t>(b.size() + 1));
  for (size_t i = 0; i <= a.size(); ++i) d[i][0] = i;
  for (size_t j = 0; j <= b.size(); ++j) d[0][j] = j;
  auto same = [](char x, char y) { return std::tolower(static_cast<unsigned char>(x)) == std::tolower(y); };
  for (size_t i = 1; i <= a.size(); ++i) {
    for (size_t j = 1; j <= b.size(); ++j) {
      d[i][j] = std::min({d[i - 1][j] + 1, d[i][j - 1] + 1, d[i - 1][j - 1] + (same(a[i - 1], b[j - 1]) ? 0 : 1)});
      if (i > 1 && j > 1 && same(a[i - 1], b[j - 2]) && same(a[i - 2], b[j - 1])) {
        d[i][j] = std::min(d[i][j], d[i - 2][j - 2] + 1);
      }
    }
  }
  return d[a.size()][b.size()];
}

bool IsObjectField(unsigned dataType) {
  return dataType == sarn::SARN_DATA_TYPE_KNOWN_DICT || dataType == sarn::SARN_DATA_TYPE_SUBDICT;
}

// The record named `name` among the fields of `info` taking part at `version`, or null. The
// names of a type at a version are indexed once: a large body repeats the same few types.
const sarn::FieldInfo* FieldNamed(const sarn::StructInfo* info, const char* name, sarn::KernoVersion version) {
  typedef std::unordered_map<std::string, const sarn::FieldInfo*> Index;
  static std::map<std::pair<const sarn::StructInfo*, sarn::KernoVersion>, Index> indexes;
  auto found = indexes.find({info, version});
  if (found == indexes.end()) {
    Index& index = indexes[{info, version}];
    for (unsigned n = 0; n < info->nFieldInfo; ++n) {
      const sarn::FieldInfo* field = sarn::FieldForVersion(info, n, version);
      if (field != nullptr) index.emplace(sarn::FieldName(info, *field), field);
    }
    found = indexes.find({info, version});
  }
  auto field = found->second.find(name);
  return field == found->second.end() ? nullptr : field->second;
}

void WalkNames(Context& context, const std::string& input, const sarn::Dictionary& dictionary,
               const sarn::StructInfo* info, sarn::KernoVersion version, const char* prefix, int status,
               size_t& count) {
  VekStringArray names(&context.poolM);
  dictionary.GetSortedNames(names);
  for (int i = 0; i < names.Count(); ++i) {
    const char* name = names[i].Utf8();
    if (std::strcmp(name, "type") == 0) continue;
    const sarn::FieldInfo* field = FieldNamed(info, name, version);
    if (field == nullptr) {
      context.Report(input, std::string(prefix) + "'" + name + "' is no field of '" + info->pName + "' at version " +
                                std::to_string(version), status);
      ++count;
      continue;
    }
    if (!IsObjectField(field->dataType)) continue;
    VekArray<sarn::DictValue> values(&context.poolM);
    dictionary.GetRange(names[i], values);
    std::vector<const sarn::Dictionary*> children;
    for (int k = 0; k < values.Count(); ++k) {
      const sarn::DictValue* value = values[k];
      if (value->kindM == sarn::DictValue::KIND_DICTIONARY) {
        children.push_back(static_cast<const sarn::Dictionary*>(value));
      } else if (value->kindM == sarn::DictValue::KIND_ARRAY) {
        const auto* array = static_cast<const sarn::ArrayValue*>(value);
        for (unsigned e = 0; e < array->CountValues(); ++e) {
          ref<sarn::DictValue> element = array->GetValueAt(e);
          if (element->kindM == sarn::DictValue::KIND_DICTIONARY) {
            children.push_back(static_cast<const sarn::Dictionary*>(element.Get()));
          }
        }
      }
    }
    for (const sarn::Dictionary* child : children) {
      // A known dict names its own type; a sub-object's type is the field's.
      const sarn::StructInfo* childInfo = sarn::StructInfoForId(field->refIndex);
      if (field->dataType == sarn::SARN_DATA_TYPE_KNOWN_DICT) {
        VekString typeName = child->GetString(VekString::FromUtf8Bytes(&context.poolM, 4, "type"));
        childInfo = sarn::StructInfoMap::LookupStructByName(typeName.Utf8());
      }
      if (childInfo != nullptr) WalkNames(context, input, *child, childInfo, version, prefix, status, count);
    }
  }
}

}  // namespace

std::string NotFoundMessage(const char* kind, const std::string& word, const std::vector<std::string>& names) {
  size_t limit = word.size() <= 4 ? 1 : word.size() <= 10 ? 2 : 3;
  std::vector<std::pair<size_t, std::string>> close;
  for (const std::string& name : names) {
    size_t distance = Distance(word, name);
    if (distance <= limit) close.emplace_back(distance, name);
  }
  std::sort(close.begin(), close.end());
  std::string message = std::string("no ") + kind + " '" + word + "'";
  for (size_t i = 0; i < close.size() && i < 5; ++i) message += (i == 0 ? "; did you mean '" : ", '") + close[i].second + "'";
  return close.empty() ? message : message + "?";
}

std::vector<std::string> TypeNames() {
  std::vector<std::string> names;
  for (int id = 0; id < sarn::Schema::nStructDefG; ++id) {
    if (const sarn::StructInfo* info = sarn::Schema::vStructDefG[id]) names.push_back(info->pName);
  }
  return names;
}

const sarn::StructInfo* TypeOption(Context& context, const std::string& name) {
  const sarn::StructInfo* info = sarn::StructInfoMap::LookupStructByName(name.c_str());
  if (info == nullptr) context.UsageError("--type: " + NotFoundMessage("type", name, TypeNames()));
  return info;
}

ref<sarn::Dictionary> ReadJson(Context& context, const std::string& input, const std::string& text) {
  VekString error;
  ref<sarn::Dictionary> dictionary = sarn::Dictionary::FromJson(reinterpret_cast<const unsigned char*>(text.data()),
                                                                text.size(), error, &context.poolM);
  if (!dictionary) context.Report(input, error.Utf8(), STATUS_INVALID);
  return dictionary;
}

bool DictionaryToObject(Context& context, const std::string& input, const ref<sarn::Dictionary>& dictionary,
                        const sarn::StructInfo* type, sarn::KernoVersion version, ref<sarn::SarnObject>& out) {
  VekString typeKey = VekString::FromUtf8Bytes(&context.poolM, 4, "type");
  if (type != nullptr) {
    if (dictionary->CountValues(typeKey) == 0) {
      dictionary->Add(typeKey, VekString::FromUtf8Bytes(&context.poolM, std::strlen(type->pName), type->pName));
    } else if (dictionary->GetString(typeKey) != type->pName) {
      context.Report(input, std::string("the input is of type '") + dictionary->GetString(typeKey).Utf8() +
                                "', not '" + type->pName + "'",
                     STATUS_INVALID);
      return false;
    }
  }
  VekString error;
  sarn::DictionarySarnObject converter(&context.poolM, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG);
  if (converter.DictionaryToSarnObject(dictionary, version, out, error)) return true;
  context.Report(input, error.Utf8(), STATUS_INVALID);
  return false;
}

std::string ObjectToJson(VekMempool* pool, const sarn::SarnObject* object, sarn::KernoVersion version, bool pretty) {
  if (pretty) {
    sarn::DictionarySarnObject converter(pool, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG);
    ref<sarn::Dictionary> dictionary = converter.SarnObjectToDictionary(object, version);
    if (!dictionary) return "";
    VekString text = dictionary->ToJson(true);
    return std::string(text.Utf8(), text.NByte());
  }
  sarn::ByteBuffer out(pool);
  sarn::JsonSarnObject writer(pool);
  if (!writer.SarnObjectToJson(object, version, out)) return "";
  return std::string(reinterpret_cast<const char*>(out.GetData()), out.GetLength());
}

size_t ReportUnknownNames(Context& context, const std::string& input, const ref<sarn::Dictionary>& dictionary,
                          sarn::KernoVersion version, const char* prefix, int status) {
  VekString typeName = dictionary->GetString(VekString::FromUtf8Bytes(&context.poolM, 4, "type"));
  const sarn::StructInfo* info = sarn::StructInfoMap::LookupStructByName(typeName.Utf8());
  size_t count = 0;
  if (info != nullptr) WalkNames(context, input, *dictionary, info, version, prefix, status, count);
  return count;
}

}  // namespace sarncli
