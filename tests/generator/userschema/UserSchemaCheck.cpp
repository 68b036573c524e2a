// Built against a library generated from user.schema: the registry holds exactly that schema.
#include <cstdio>
#include <cstring>

#include "sarn/Sarn.h"

namespace {
int failures = 0;
void Check(bool ok, const char* what) {
  if (!ok) {
    std::printf("FAILED: %s\n", what);
    ++failures;
  }
}
}  // namespace

int main() {
  using namespace sarn;
  Check(Schema::nStructTypeG == 8, "eight types");
  Check(Schema::nStructDefG == 2239, "slots up to the highest id");
  Check(Schema::nEnumTypeG == 2 && Schema::nEnumDefG == 702, "two enums");
  Check(Schema::firstSchemaVersionG == 1 && Schema::lastSchemaVersionG == 3 && Schema::defaultSchemaVersionG == 3,
        "versions");
  Check(StructInfoMap::LookupStructByName("address") == nullptr, "no default types");
  const StructInfo* greeting = StructInfoMap::LookupStructByName("greeting");
  Check(greeting == &sarnschema::Greeting::structInfoG && Schema::vStructDefG[20] == greeting, "greeting registered");
  Check(greeting->nFieldInfo == 7 && std::strcmp(greeting->pIdPrefix, "user:gr.") == 0, "greeting table");
  Check(greeting->vFieldInfo[4].typeBits == 0x0075, "retired number 4 is a placeholder");
  Check(greeting->vFieldInfoHistory[3].nFieldInfo == 1 &&
            greeting->vFieldInfoHistory[3].vFieldInfo[0].arity == SARN_ARITY_REQUIRED,
        "older record of mood");
  Check(FieldForVersion(greeting, 3, 1) == &greeting->vFieldInfoHistory[3].vFieldInfo[0], "rule B at version 1");
  Check(FieldForVersion(greeting, 3, 2) == &greeting->vFieldInfo[3], "rule B at version 2");
  Check(std::strcmp(EnumNumberName(701, 5), "cheerful") == 0 && EnumNumberName(701, 1) == nullptr, "enum names");
  {
    VekMempool pool("user");
    {
      ref<SarnObject> object = greeting->pFactory(&pool);
      auto* g = static_cast<sarnschema::Greeting*>(object.Get());
      g->textM = VekString("hello");
      g->recipientsM.Add(VekString("you"));
      g->senderM = sarnschema::Person::Factory(&pool);
      Check(object->GetTypeId() == 20 && object->GetTypeName() == "greeting", "object of the user type");
      Check(!g->fHasMoodM && !g->fHasGreetingIdM, "flags start clear");
    }
    Check(pool.GetUsedBytes() == 0, "everything released");
  }
  if (failures == 0) std::printf("user schema: all checks passed\n");
  return failures == 0 ? 0 : 1;
}
