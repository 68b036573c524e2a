// The conversion members (texts from a table, also with a rebuilt name cache) and Clone: the
// copy's type, pool and sharing, the ids it refuses before making anything, and how exact a copy
// through the dictionary texts is.
#include <gtest/gtest.h>

#include "runtime/ObjectOpsSupport.h"
#include "testutil/TestUtil.h"

using namespace sarn;
using objopstest::FieldNamed;
using objopstest::FromJson;
using sarntest::Str;

// Rows: JSON of an object => version => compact or pretty => the text expected of ToString,
// ToDictionary and ToDict alike.
TEST(ObjectConvert, TextsOfEveryMemberAtEachVersion) {
  VekMempool pool("texts");
  for (int round = 0; round < 2; ++round) {
    for (const auto& row : sarntest::ReadTable("objects/object-texts.txt", 4)) {
      ref<SarnObject> object = FromJson(&pool, row[0]);
      const KernoVersion version = static_cast<KernoVersion>(std::stoi(row[1]));
      const bool isPretty = row[2] == "pretty";
      EXPECT_EQ(Str(object->ToString(isPretty, version)), row[3]) << row[0] << " at " << row[1];
      EXPECT_EQ(Str(object->ToDictionary(version)->ToJson(isPretty)), row[3]) << row[0] << " at " << row[1];
      EXPECT_EQ(Str(object->ToDict(version)->ToString(isPretty)), row[3]) << row[0] << " at " << row[1];
    }
    DestroyGlobalSarnHashTable();
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

TEST(ObjectClone, KeepsItsTypeRefusesBadIdsAndSharesOnlyPayloads) {
  VekMempool pool("clone");
  ref<SarnObject> address = FromJson(&pool, R"({"type": "address", "city": "Oslo", "levelOfDetail": "high"})");
  for (unsigned id : {191u, 543u, 1259u}) {
    ref<SarnObject> copy = address->Clone(id);
    ASSERT_TRUE(copy && dynamic_cast<sarnschema::Address*>(copy.Get()) != nullptr) << id;
    EXPECT_TRUE(*copy == *address && copy->GetMempool() == &pool) << id;
  }
  unsigned empty = 1;
  while (StructInfoForId(empty) != nullptr) ++empty;
  pool.FailAllocationAfter(1000000);
  for (unsigned id : {0u, empty, static_cast<unsigned>(Schema::nStructDefG), 0xFFFFFFFFu}) EXPECT_FALSE(address->Clone(id)) << id;
  EXPECT_EQ(pool.GetFailCountdown(), 1000000) << "allocations made for a refused id";
  pool.FailAllocationAfter(-1);

  ref<SarnObject> error = FromJson(&pool, R"({"type": "error", "code": "timeout", "cause": {"type": "success"}, "traceInfo": {"a": "1"}})");
  ref<SarnObject> request = FromJson(&pool, R"({"type": "kernoRpcRequest", "request": {"type": "success"}})");
  ref<SarnObject> errorCopy = error->Clone(346), requestCopy = request->Clone(975);
  const FieldInfo &cause = *FieldNamed(error->GetStructInfo(), "cause"), &trace = *FieldNamed(error->GetStructInfo(), "traceInfo");
  const FieldInfo& body = *FieldNamed(request->GetStructInfo(), "request");
  ASSERT_TRUE(errorCopy && requestCopy);
  EXPECT_NE(FieldAccess::ReferenceAt(errorCopy.Get(), cause, 0), FieldAccess::ReferenceAt(error.Get(), cause, 0));
  EXPECT_TRUE(*errorCopy == *error && *requestCopy == *request);
  EXPECT_EQ(FieldAccess::ReferenceAt(requestCopy.Get(), body, 0), FieldAccess::ReferenceAt(request.Get(), body, 0));
  FieldRef<ref<Dict>>(error.Get(), trace)->AddString("b", "2");
  EXPECT_EQ(FieldRef<ref<Dict>>(errorCopy.Get(), trace)->CountValues("b"), 1u);
}

TEST(ObjectClone, IsAsExactAsTheDictionaryTexts) {
  VekMempool pool("exact");
  ref<SarnObject> object = StructInfoForId(1259)->pFactory(&pool);
  const StructInfo* info = object->GetStructInfo();
  FieldRef<double>(object.Get(), *FieldNamed(info, "float")) = 1.234567891;
  FieldRef<uint64_t>(object.Get(), *FieldNamed(info, "idLong")) = (0x7777ull << 48) | 5;
  FieldRef<ChannelNumber>(object.Get(), *FieldNamed(info, "channelNumber")) = ChannelNumber(5, 1);
  FieldRef<Currency>(object.Get(), *FieldNamed(info, "currency")) = Currency(5, "USD");
  ref<SarnObject> copy = object->Clone(1259);
  ASSERT_TRUE(copy);
  EXPECT_EQ(FieldRef<double>(copy.Get(), *FieldNamed(info, "float")), 1.2345679);
  EXPECT_EQ(FieldRef<uint64_t>(copy.Get(), *FieldNamed(info, "idLong")), 0u);
  FieldRef<uint32_t>(object.Get(), *FieldNamed(info, "enum")) = 7;  // dayOfWeek names 0 to 6
  EXPECT_FALSE(object->Clone(1259));
  // The readers' limit counts each list twice (its dictionary and its item array), then the success.
  EXPECT_TRUE(objopstest::Nest(&pool, JsonLimits::kDefaultMaxDepth / 2 - 1, "")->Clone(644));
  EXPECT_FALSE(objopstest::Nest(&pool, JsonLimits::kDefaultMaxDepth / 2, "")->Clone(644));
}
