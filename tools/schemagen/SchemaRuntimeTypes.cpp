// The types the runtime itself names by class and by id (the error object and the version-1
// envelopes). Any schema the library is built from must carry them with these ids and at least
// these fields, or the runtime would not compile or would misread messages; the check turns that
// into a clear refusal instead.
#include "SchemaModel.h"

namespace schemagen {
namespace {

struct RuntimeField {
  const char* name;
  int dataType;
  int arity;
};

struct RuntimeType {
  const char* name;
  int id;
  RuntimeField fields[8];
};

const RuntimeType kRuntimeTypes[] = {
    {"error", 346,
     {{"code", DT_ENUM, AR_REQUIRED}, {"debug", DT_STRING, AR_OPTIONAL}, {"text", DT_STRING, AR_REQUIRED},
      {"retryInterval", DT_S32, AR_OPTIONAL}, {"cause", DT_KNOWN_DICT, AR_OPTIONAL},
      {"traceInfo", DT_ANY_DICT, AR_OPTIONAL}}},
    {"kernoRpcCancel", 974, {{"rpcId", DT_S32, AR_REQUIRED}, {"headers", DT_ANY_DICT, AR_OPTIONAL}}},
    {"kernoRpcRequest", 975,
     {{"monitorFutureChanges", DT_BOOL, AR_REQUIRED}, {"request", DT_KNOWN_DICT_AS_LAZY, AR_REQUIRED},
      {"rpcId", DT_S32, AR_REQUIRED}, {"kernoVersion", DT_S32, AR_REQUIRED}, {"partnerId", DT_INT_ID, AR_OPTIONAL},
      {"sendAndForget", DT_BOOL, AR_OPTIONAL}, {"headers", DT_ANY_DICT, AR_OPTIONAL}}},
    {"kernoRpcResponse", 976,
     {{"isFinalResponse", DT_BOOL, AR_REQUIRED}, {"response", DT_KNOWN_DICT_AS_LAZY, AR_REQUIRED},
      {"rpcId", DT_S32, AR_REQUIRED}, {"kernoVersion", DT_S32, AR_OPTIONAL}, {"headers", DT_ANY_DICT, AR_OPTIONAL}}},
    {"kernoRpcHello", 1449, {{"identity", DT_STRING, AR_MULTI}}},
    {"kernoRpcRequestUpdate", 2238,
     {{"headers", DT_ANY_DICT, AR_OPTIONAL}, {"request", DT_KNOWN_DICT_AS_LAZY, AR_REQUIRED},
      {"rpcId", DT_S32, AR_REQUIRED}}},
};

}  // namespace

void CheckRuntimeTypes(const Schema& schema, std::vector<Diagnostic>& errors) {
  for (const RuntimeType& wanted : kRuntimeTypes) {
    const Type* type = nullptr;
    for (const Type& t : schema.types) {
      if (t.name == wanted.name) type = &t;
    }
    if (type == nullptr || type->id != wanted.id) {
      errors.push_back({type == nullptr ? 0 : type->line, std::string("the library needs type '") + wanted.name +
                                                              "' with id " + std::to_string(wanted.id)});
      continue;
    }
    for (const RuntimeField& field : wanted.fields) {
      if (field.name == nullptr) break;
      const Field* found = nullptr;
      for (const Field& f : type->fields) {
        if (f.name == field.name) found = &f;
      }
      if (found == nullptr || found->current.dataType != field.dataType || found->current.arity != field.arity) {
        errors.push_back({found == nullptr ? type->line : found->line,
                          std::string("the library needs field '") + field.name + "' of type '" + wanted.name +
                              "' as " + GetDataTypeInfo(field.dataType).keyword + " " + ArityKeyword(field.arity)});
      }
    }
  }
}

}  // namespace schemagen
