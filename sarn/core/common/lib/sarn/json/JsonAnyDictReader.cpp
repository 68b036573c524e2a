// The free-form reader of the JSON-to-object reader: a JSON object into a Dict, every scalar as
// its text, lists as repeated values under one name. Objects it opens take ordinals as in the
// first pass, which walked them like any object.
#include "sarn/json/internal/JsonObjectReader.h"

namespace sarn {

using internal::Append;
using internal::ReadToken;
using internal::SkipPeek;
using internal::Take;
using internal::TokenText;

namespace {

const char kBadAnyFieldG[] = "bad field in AnyDictValue";
const char kAnyNoEndG[] = "expected , or }";
const char kAnyBadStringG[] = "failed to read string in UnmarshalAnyDictValue";
const char kAnyBadNameG[] = "UnmarshalAnyDictField can't read fieldName";
const char kAnyNoColonG[] = "UnmarshalAnyDictField expected :";
const char kAnyBadValueG[] = "bad value in AnyDictField";

}  // namespace

// ---- Free-form dictionaries -------------------------------------------------------------------

bool JsonSarnObject::Reader::AnyValue(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                      dictvalue::Type& type, VekString& text, ref<Dict>& dict, VekString& error) {
  VekMempool* pool = self.pMempoolM;
  if (SkipPeek(input) != '{') {
    type = dictvalue::TYPE_STRING;
    TokenText token;
    VekString& hold = State(self)->holdM;
    if (!ReadToken(pool, input, token, hold)) {
      Replace(self, error, kAnyBadStringG);
      return false;
    }
    text = internal::TokenString(pool, token, hold);
    return true;
  }
  type = dictvalue::TYPE_DICT;
  input.Next();
  ++self.nObjectIndexM;  // the first pass gave this object an ordinal too
  if (TooDeep(self, depth + 1, error)) return false;
  for (;;) {
    if (!dict) {
      dict = MakeDict(pool);
      if (!dict) {
        Replace(self, error, kOutOfMemoryMessage);
        return false;
      }
    }
    if (!AnyField(self, depth + 1, input, dict, error)) {
      Replace(self, error, kBadAnyFieldG);
      return false;
    }
    char c = Take(input);
    if (c == '}') return true;
    if (c != ',') {
      Replace(self, error, kAnyNoEndG);
      return false;
    }
  }
}

bool JsonSarnObject::Reader::AnyField(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                      const ref<Dict>& dict, VekString& error) {
  VekMempool* pool = self.pMempoolM;
  VekString name;
  if (!JsonBytesourceToString(pool, nullptr, input, name)) {
    Replace(self, error, kAnyBadNameG);
    return false;
  }
  if (Take(input) != ':') {
    Replace(self, error, kAnyNoColonG);
    return false;
  }
  bool isList = SkipPeek(input) == '[';
  if (isList) {
    input.Next();
    if (TooDeep(self, depth + 1, error)) return false;
    ++depth;
  }
  for (;;) {
    uint64_t before = input.BytesDelivered() - static_cast<uint64_t>(input.pEndM - input.pCurM);
    dictvalue::Type type = dictvalue::TYPE_NONE;
    VekString text;
    ref<Dict> value;
    if (!AnyValue(self, depth, input, type, text, value, error)) {
      Replace(self, error, kAnyBadValueG);
      return false;
    }
    uint64_t after = input.BytesDelivered() - static_cast<uint64_t>(input.pEndM - input.pCurM);
    bool isAdded = type == dictvalue::TYPE_DICT ? dict->AddDict(name, value) : dict->AddString(name, text);
    if (!isAdded) {
      bool isFull = dict->CountValues(name) >= kMaxValuesPerContainer;
      Replace(self, error, isFull ? kJsonRepeatedKeyLimitMessage : kOutOfMemoryMessage);
      return false;
    }
    if (!isList) return true;
    char c = SkipPeek(input);
    // A value that read nothing is only the empty one before the closing bracket.
    if (before == after && c != ']') {
      Replace(self, error, kAnyBadValueG);
      return false;
    }
    if (c == ']') {
      input.Next();
      return true;
    }
    if (c == ',') input.Next();
  }
}

bool JsonSarnObject::UnmarshalAnyDict(int depth, InputPointerBytesource& input, ref<Dict>* result,
                                      VekString& error) {
  if (!Reader::Ready(*this, error)) return false;
  if (depth == 0) pReadStateM->isDepthRefusedM = false;
  dictvalue::Type type = dictvalue::TYPE_NONE;
  VekString text;
  ref<Dict> dict;
  bool isOk = Reader::AnyValue(*this, depth, input, type, text, dict, error) && type == dictvalue::TYPE_DICT;
  pReadStateM->holdM = VekString();
  if (!isOk) return false;
  if (result != nullptr) *result = dict;
  return true;
}

bool JsonSarnObject::UnmarshalAnyDict(InputPointerBytesource& input, ref<Dict>* result) {
  VekString error;
  return UnmarshalAnyDict(0, input, result, error);
}

bool JsonSarnObject::UnmarshalAnyDictValue(int depth, InputPointerBytesource& input, dictvalue::Type& type,
                                           VekString& text, ref<Dict>& dict, VekString& error) {
  return Reader::Ready(*this, error) && Reader::AnyValue(*this, depth, input, type, text, dict, error);
}

bool JsonSarnObject::UnmarshalAnyDictField(int depth, InputPointerBytesource& input, const ref<Dict>& dict,
                                           VekString& error) {
  return Reader::Ready(*this, error) && Reader::AnyField(*this, depth, input, dict, error);
}

}  // namespace sarn
