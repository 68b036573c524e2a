// The conversion members and Clone: a table of texts (also with a rebuilt name cache) and of how
// exact a copy through the dictionary texts is; then the copy's class, what it shares, and the ids
// it refuses before making anything.
#include <gtest/gtest.h>

#include "runtime/ObjectOpsSupport.h"

using namespace objopstest;

// Rows: "text VERSION compact|pretty" => JSON of an object => the text of all three members;
// "clone ID type.field" => the field's value (as Side takes it) => the copy's field's text ("-":
// not written, "null": no copy) => whether the copy's field equals the source's.
TEST(ObjectConvert, TextsAndCopiesFromTable) {
  VekMempool pool("conversions");
  for (int round = 0; round < 2; ++round, DestroyGlobalSarnHashTable()) {
    for (const auto& row : sarntest::ReadTable("objects/conversions.txt", 4)) {
      std::stringstream words(row[0]);
      std::string op, number, subject, what = row[0] + " of " + row[1];
      words >> op >> number >> subject;
      const FieldInfo* f = nullptr;
      ref<SarnObject> object = op == "text" ? FromJson(&pool, row[1]) : Side(&pool, subject, row[1], f);
      if (op == "text") {
        const int version = std::stoi(number);
        EXPECT_EQ(Str(object->ToString(subject == "pretty", version)), row[2]) << what;
        EXPECT_EQ(Str(object->ToDictionary(version)->ToJson(subject == "pretty")) + Str(object->ToDict(version)->ToString(subject == "pretty")), row[2] + row[2]) << what;
        continue;
      }
      ref<SarnObject> copy = object->Clone(static_cast<unsigned>(std::stoul(number)));
      ref<Dictionary> tree = copy ? copy->ToDictionary(0) : nullptr;
      const VekString name(FieldName(object->GetStructInfo(), *f));
      EXPECT_EQ(!tree ? "null" : tree->CountValues(name) == 0 ? "-" : Str(tree->GetString(name)), row[2]) << what;
      EXPECT_TRUE(!copy || (copy->GetTypeId() == object->GetTypeId() && copy->GetMempool() == &pool &&
                            SarnObject::SingleFieldEquals(f, FieldStorage(copy.Get(), *f), FieldStorage(object.Get(), *f)) == (row[3] == "equal"))) << what;
    }
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

TEST(ObjectClone, RebuildsObjectsSharesPayloadsAndRefusesBadIdsFirst) {
  VekMempool pool("clone");
  ref<SarnObject> error = FromJson(&pool, R"({"type": "error", "code": "timeout", "cause": {"type": "success"}, "traceInfo": {"a": "1"}})");
  ref<SarnObject> request = FromJson(&pool, R"({"type": "kernoRpcRequest", "request": {"type": "success"}})");
  ref<SarnObject> errorCopy = error->Clone(191), requestCopy = request->Clone(975);
  ASSERT_TRUE(errorCopy && requestCopy && dynamic_cast<sarnschema::Error*>(errorCopy.Get()) != nullptr);
  auto *e = static_cast<sarnschema::Error*>(error.Get()), *eCopy = static_cast<sarnschema::Error*>(errorCopy.Get());
  EXPECT_TRUE(*errorCopy == *error && *requestCopy == *request && eCopy->causeM != e->causeM);
  EXPECT_EQ(static_cast<sarnschema::KernoRpcRequest*>(requestCopy.Get())->requestM, static_cast<sarnschema::KernoRpcRequest*>(request.Get())->requestM);
  e->traceInfoM->AddString("b", "2");
  EXPECT_EQ(eCopy->traceInfoM->CountValues("b"), 1u);
  unsigned empty = 1;
  while (StructInfoForId(empty) != nullptr) ++empty;
  pool.FailAllocationAfter(1000000);
  for (unsigned id : {0u, empty, static_cast<unsigned>(Schema::nStructDefG), 0xFFFFFFFFu}) EXPECT_FALSE(error->Clone(id)) << id;
  EXPECT_EQ(pool.GetFailCountdown(), 1000000) << "allocations made for a refused id";
  pool.FailAllocationAfter(-1);
  // The readers' limit counts each list twice (its dictionary and its item array), then the success.
  EXPECT_TRUE(Nest(&pool, JsonLimits::kDefaultMaxDepth / 2 - 1, "")->Clone(644) && !Nest(&pool, JsonLimits::kDefaultMaxDepth / 2, "")->Clone(644));
}
