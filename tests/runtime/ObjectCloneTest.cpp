// The conversion members and Clone. A table gives the texts of ToString, ToDictionary and ToDict
// (also with a rebuilt name cache) and how exact a copy through the dictionary texts is; the rest
// is the copy's class, pool and sharing, and the ids refused before anything is made.
#include <gtest/gtest.h>

#include "runtime/ObjectOpsSupport.h"
#include "testutil/TestUtil.h"

using namespace sarn;
using namespace objopstest;
using sarntest::Str;

// Rows: "text VERSION compact|pretty" => JSON of an object => the text of all three members;
// "clone ID type.field" => the field's value (as Side takes it) => the copy's field's text ("-":
// not written, "null": no copy) => whether the copy's field equals the source's.
TEST(ObjectConvert, TextsAndCopiesFromTable) {
  VekMempool pool("conversions");
  for (int round = 0; round < 2; ++round) {
    for (const auto& row : sarntest::ReadTable("objects/conversions.txt", 4)) {
      std::stringstream words(row[0]);
      std::string op, number, subject;
      words >> op >> number >> subject;
      const std::string what = row[0] + " of " + row[1];
      if (op == "text") {
        ref<SarnObject> object = FromJson(&pool, row[1]);
        const KernoVersion version = static_cast<KernoVersion>(std::stoi(number));
        const bool isPretty = subject == "pretty";
        EXPECT_EQ(Str(object->ToString(isPretty, version)), row[2]) << what;
        EXPECT_EQ(Str(object->ToDictionary(version)->ToJson(isPretty)), row[2]) << what;
        EXPECT_EQ(Str(object->ToDict(version)->ToString(isPretty)), row[2]) << what;
        continue;
      }
      const FieldInfo* field = nullptr;
      ref<SarnObject> object = Side(&pool, subject, row[1], field);
      ref<SarnObject> copy = object->Clone(static_cast<unsigned>(std::stoul(number)));
      ref<Dictionary> tree = copy ? copy->ToDictionary(0) : nullptr;
      const VekString name(FieldName(object->GetStructInfo(), *field));
      EXPECT_EQ(!tree ? "null" : tree->CountValues(name) == 0 ? "-" : Str(tree->GetString(name)), row[2]) << what;
      if (!copy) continue;
      EXPECT_EQ(SarnObject::SingleFieldEquals(field, FieldStorage(copy.Get(), *field), FieldStorage(object.Get(), *field)), row[3] == "equal") << what;
      EXPECT_TRUE(copy->GetTypeId() == object->GetTypeId() && copy->GetMempool() == &pool) << what;
    }
    DestroyGlobalSarnHashTable();
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

TEST(ObjectClone, RebuildsObjectsSharesPayloadsAndRefusesBadIdsFirst) {
  VekMempool pool("clone");
  ref<SarnObject> error = FromJson(&pool, R"({"type": "error", "code": "timeout", "cause": {"type": "success"}, "traceInfo": {"a": "1"}})");
  ref<SarnObject> request = FromJson(&pool, R"({"type": "kernoRpcRequest", "request": {"type": "success"}})");
  ref<SarnObject> errorCopy = error->Clone(191), requestCopy = request->Clone(975);
  ASSERT_TRUE(errorCopy && requestCopy && dynamic_cast<sarnschema::Error*>(errorCopy.Get()) != nullptr);
  const FieldInfo &cause = *FieldNamed(error->GetStructInfo(), "cause"), &trace = *FieldNamed(error->GetStructInfo(), "traceInfo");
  const FieldInfo& body = *FieldNamed(request->GetStructInfo(), "request");
  EXPECT_TRUE(*errorCopy == *error && *requestCopy == *request);
  EXPECT_NE(FieldAccess::ReferenceAt(errorCopy.Get(), cause, 0), FieldAccess::ReferenceAt(error.Get(), cause, 0));
  EXPECT_EQ(FieldAccess::ReferenceAt(requestCopy.Get(), body, 0), FieldAccess::ReferenceAt(request.Get(), body, 0));
  FieldRef<ref<Dict>>(error.Get(), trace)->AddString("b", "2");
  EXPECT_EQ(FieldRef<ref<Dict>>(errorCopy.Get(), trace)->CountValues("b"), 1u);
  unsigned empty = 1;
  while (StructInfoForId(empty) != nullptr) ++empty;
  pool.FailAllocationAfter(1000000);
  for (unsigned id : {0u, empty, static_cast<unsigned>(Schema::nStructDefG), 0xFFFFFFFFu}) EXPECT_FALSE(error->Clone(id)) << id;
  EXPECT_EQ(pool.GetFailCountdown(), 1000000) << "allocations made for a refused id";
  pool.FailAllocationAfter(-1);
  // The readers' limit counts each list twice (its dictionary and its item array), then the success.
  EXPECT_TRUE(Nest(&pool, JsonLimits::kDefaultMaxDepth / 2 - 1, "")->Clone(644));
  EXPECT_FALSE(Nest(&pool, JsonLimits::kDefaultMaxDepth / 2, "")->Clone(644));
}
