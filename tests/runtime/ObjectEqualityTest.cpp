// Equality by its rules: one value or array of each data type compared through the two static
// members on an object's storage (a table), whole objects (a table of JSON pairs), and what a
// comparison must not do: allocate for plain objects, or use C stack for depth.
#include <gtest/gtest.h>

#include <cstdlib>
#include <sstream>

#include "runtime/ObjectOpsSupport.h"
#include "testutil/TestUtil.h"

using namespace sarn;
using objopstest::FromJson;

namespace {

VekString Text(VekMempool* pool, const std::string& text) { return VekString::FromUtf8Bytes(pool, text.size(), text.data()); }

// One value of `field` from its table text, stored into (or appended to) `object`. References:
// "null", JSON of a tree, "json:" or "dict:" before a payload's JSON, bytes as text.
void Put(VekMempool* pool, SarnObject* object, const FieldInfo& field, const std::string& text) {
  const unsigned type = field.dataType;
  if (TraitsOf(type).storage == DataTypeTraits::STORAGE_STRING) {
    FieldAccess::PutString(object, field, Text(pool, text));
  } else if (TraitsOf(type).storage == DataTypeTraits::STORAGE_REFERENCE) {
    ref<VekCore> value;
    VekString error;
    if (text == "null") {
    } else if (type == SARN_DATA_TYPE_BYTESTRING) {
      value = vek::ByteBuffer::New(pool, reinterpret_cast<const unsigned char*>(text.data()), text.size());
    } else if (type == SARN_DATA_TYPE_ANY_DICT || text.rfind("dict:", 0) == 0) {
      ref<Dict> dict = MempoolNew<Dict, ref<Dictionary>>(pool, Dictionary::FromJson(Text(pool, text.substr(text.find('{'))), error, pool));
      value = type == SARN_DATA_TYPE_ANY_DICT ? ref<VekCore>(dict) : ref<VekCore>(LazyDict::FromDict(pool, dict, 0));
    } else if (text.rfind("json:", 0) == 0) {
      value = LazyDict::FromJsonString(pool, Text(pool, text.substr(5)), 0);
    } else {
      value = FromJson(pool, text);
    }
    FieldAccess::PutReference(object, field, value.Get());
  } else {
    unsigned char bytes[8] = {};
    if (type == SARN_DATA_TYPE_FLOAT) {
      double value = std::strtod(text.c_str(), nullptr);
      std::memcpy(bytes, &value, 8);
    } else if (type == SARN_DATA_TYPE_CHANNEL_NUMBER) {
      ChannelNumber value = ChannelNumber::Parse(Text(pool, text));
      std::memcpy(bytes, &value, 8);
    } else if (type == SARN_DATA_TYPE_CURRENCY) {
      Currency value = Currency::Parse(Text(pool, text));
      std::memcpy(bytes, &value, 8);
    } else {
      uint64_t value = std::strtoull(text.c_str(), nullptr, 0);  // little-endian: the low bytes first
      std::memcpy(bytes, &value, 8);
    }
    FieldAccess::PutScalar(object, field, bytes);
  }
}

}  // namespace

// Rows: type.field => values of one side => of the other ('|' between elements, '~' for none) => result.
TEST(ObjectEquality, FieldRulesHoldInBothOrders) {
  VekMempool pool("fields");
  for (const auto& row : sarntest::ReadTable("objects/field-equality.txt", 4)) {
    const StructInfo* info = StructInfoMap::LookupStructByName(row[0].substr(0, row[0].find('.')).c_str());
    const FieldInfo* field = objopstest::FieldNamed(info, row[0].substr(row[0].find('.') + 1).c_str());
    ASSERT_NE(field, nullptr) << row[0];
    ref<SarnObject> sides[2] = {info->pFactory(&pool), info->pFactory(&pool)};
    for (int side = 0; side < 2; ++side) {
      std::stringstream values(row[1 + side]);
      for (std::string value; row[1 + side] != "~" && std::getline(values, value, '|');) Put(&pool, sides[side].Get(), *field, value);
    }
    auto equals = field->arity == SARN_ARITY_MULTI ? &SarnObject::MultiFieldEquals : &SarnObject::SingleFieldEquals;
    void* a = FieldStorage(sides[0].Get(), *field);
    void* b = FieldStorage(sides[1].Get(), *field);
    EXPECT_EQ(equals(field, a, b), row[3] == "equal") << row[0] << ": " << row[1] << " against " << row[2];
    EXPECT_EQ(equals(field, b, a), row[3] == "equal") << row[0] << ": " << row[2] << " against " << row[1];
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

// Rows: JSON of one object => of the other ('=': the same object) => result, both ways.
TEST(ObjectEquality, ObjectsCompareFieldByField) {
  VekMempool pool("objects");
  for (const auto& row : sarntest::ReadTable("objects/object-equality.txt", 3)) {
    ref<SarnObject> a = FromJson(&pool, row[0]);
    ref<SarnObject> b = row[1] == "=" ? a : FromJson(&pool, row[1]);
    ASSERT_TRUE(a && b) << row[0] << " / " << row[1];
    EXPECT_EQ(*a == *b && *b == *a, row[2] == "equal") << row[0] << " against " << row[1];
    EXPECT_EQ(*a != *b, row[2] != "equal") << row[0] << " against " << row[1];
  }
}

TEST(ObjectEquality, AbsentStorageIsNotComparedAndPlainObjectsAllocateNothing) {
  VekMempool pool("plain");
  ref<SarnObject> a = FromJson(&pool, R"({"type":"unifiedItemList","isTop":false,"item":[{"type":"success"},{"type":"unifiedItemList"}]})");
  ref<SarnObject> b = objopstest::JsonCopy(&pool, a.Get());
  const FieldInfo& isBottom = *objopstest::FieldNamed(a->GetStructInfo(), "isBottom");
  FieldRef<uint8_t>(a.Get(), isBottom) = 1;
  pool.FailAllocationAfter(1000000);
  EXPECT_TRUE(*a == *b);
  EXPECT_EQ(pool.GetFailCountdown(), 1000000) << "allocations made by a comparison";
  pool.FailAllocationAfter(-1);
  MarkFieldPresent(a.Get(), isBottom);
  EXPECT_TRUE(*a != *b && *b != *a);
  MarkFieldPresent(b.Get(), isBottom);
  EXPECT_TRUE(*a != *b);
  FieldRef<uint8_t>(b.Get(), isBottom) = 1;
  EXPECT_TRUE(*a == *b);
}

TEST(ObjectEquality, DepthUsesNoCStack) {
  VekMempool pool("deep");
  const int depth = 10 * JsonLimits::kDefaultMaxDepth;
  ref<SarnObject> a = objopstest::Nest(&pool, depth, "bottom"), b = objopstest::Nest(&pool, depth, "bottom"),
                  c = objopstest::Nest(&pool, depth, "other");
  sarntest::RunOnStack(256 * 1024, [&] {
    EXPECT_TRUE(*a == *b);
    EXPECT_TRUE(*a != *c && *c != *a);
  });
}
