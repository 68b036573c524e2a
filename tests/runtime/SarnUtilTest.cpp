#include <string>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace {

using sarn::SarnUtil;

using sarntest::Str;

TEST(SarnUtilTest, NamespaceOfALongId) {
  EXPECT_EQ(SarnUtil::GetNamespaceForId(0), nullptr);
  EXPECT_EQ(SarnUtil::GetNamespaceForId(0xFFFFFFFFFFFFull), nullptr) << "top 16 bits 0";
  EXPECT_EQ(SarnUtil::GetNamespaceForId(4ull << 48), nullptr);
  EXPECT_STREQ(SarnUtil::GetNamespaceForId(0x4000ull << 48), "vod");
  EXPECT_STREQ(SarnUtil::GetNamespaceForId((5ull << 48) + 12), "tms.ep");
  EXPECT_STREQ(SarnUtil::GetNamespaceForId(1ull << 48), "rs");
  EXPECT_STREQ(SarnUtil::GetNamespaceForId(10ull << 48), "dlna");
  EXPECT_EQ(SarnUtil::GetNamespaceForId(0xFFFFull << 48), nullptr);
}

TEST(SarnUtilTest, UnknownEnumsAndNumbers) {
  unsigned int number = 77;
  EXPECT_FALSE(SarnUtil::EnumNameToNumber(-1, VekString("cable"), number));
  EXPECT_FALSE(SarnUtil::EnumNameToNumber(sarn::Schema::nEnumDefG, VekString("cable"), number));
  EXPECT_EQ(number, 77u);
  EXPECT_EQ(Str(SarnUtil::EnumNumberToName(sarn::Schema::nEnumDefG, 0)), "");
  EXPECT_EQ(Str(SarnUtil::EnumNumberToName(-1, 0)), "");
  EXPECT_EQ(Str(sarn::ObjectIdAndType(5, 0xFFFF).ToString()), "") << "a type id that names no type";
  EXPECT_EQ(sarn::ObjectIdAndType::nil, sarn::ObjectIdAndType());
  EXPECT_EQ(sarn::ObjectIdAndType::nil.objectIdM, 0u);
  EXPECT_EQ(sarn::ObjectIdAndType::nil.typeIdM, 0u);
}

// These need the generated schema in the registry.
class SarnUtilSchemaTest : public ::testing::Test {
 protected:
  void SetUp() override {
    if (sarn::Schema::nEnumTypeG == 0 || sarn::Schema::nStructTypeG == 0) GTEST_SKIP() << "no schema compiled in";
  }
};

TEST_F(SarnUtilSchemaTest, EnumNamesAndNumbers) {
  EXPECT_EQ(Str(SarnUtil::EnumNumberToName(682, 2)), "cable");
  unsigned int number = 0;
  EXPECT_TRUE(SarnUtil::EnumNameToNumber(682, VekString("cable"), number));
  EXPECT_EQ(number, 2u);
  EXPECT_EQ(Str(SarnUtil::EnumNumberToName(692, 0)), "sunday");
  EXPECT_EQ(Str(SarnUtil::EnumNumberToName(692, 6)), "saturday");
  EXPECT_EQ(Str(SarnUtil::EnumNumberToName(692, 7)), "");
  number = 99;
  EXPECT_FALSE(SarnUtil::EnumNameToNumber(692, VekString(""), number));
  EXPECT_FALSE(SarnUtil::EnumNameToNumber(692, VekString("Sunday"), number));
  EXPECT_EQ(number, 99u);
  // Unused numbers of an enum never match and have no name.
  for (int id = 0; id < sarn::Schema::nEnumDefG; ++id) {
    const sarn::EnumDef* def = sarn::Schema::vEnumDefG[id];
    if (def == nullptr) continue;
    for (uint64_t i = 0; i < def->nValue; ++i) {
      if (def->vName[i] == nullptr) {
        ASSERT_EQ(Str(SarnUtil::EnumNumberToName(id, static_cast<unsigned int>(i))), "");
      }
    }
  }
}

TEST_F(SarnUtilSchemaTest, ObjectIdAndTypeText) {
  const sarn::StructInfo* withPrefix = nullptr;
  const sarn::StructInfo* withoutPrefix = nullptr;
  int idWith = 0, idWithout = 0;
  for (int id = 0; id < sarn::Schema::nStructDefG && id <= 0xFFFF; ++id) {
    const sarn::StructInfo* info = sarn::Schema::vStructDefG[id];
    if (info == nullptr) continue;
    if (info->pIdPrefix != nullptr && withPrefix == nullptr) withPrefix = info, idWith = id;
    if (info->pIdPrefix == nullptr && withoutPrefix == nullptr) withoutPrefix = info, idWithout = id;
  }
  ASSERT_NE(withPrefix, nullptr);
  EXPECT_EQ(Str(sarn::ObjectIdAndType(4294967295u, static_cast<uint16_t>(idWith)).ToString()),
            std::string(withPrefix->pIdPrefix) + "4294967295 - " + withPrefix->pName);
  if (withoutPrefix != nullptr) {
    EXPECT_EQ(Str(sarn::ObjectIdAndType(5, static_cast<uint16_t>(idWithout)).ToString()),
              std::string("5 - ") + withoutPrefix->pName);
  }
}

}  // namespace
