#include <string>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace {

using sarn::SarnUtil;
using sarntest::Str;

TEST(SarnUtilTest, NamespaceOfALongId) {
  // The top 16 bits name the namespace; codes without one (0, 4, 0xFFFF) give null.
  const std::pair<unsigned long long, const char*> cases[] = {
      {0, nullptr}, {0xFFFFFFFFFFFFull, nullptr}, {4ull << 48, nullptr}, {0x4000ull << 48, "vod"},
      {(5ull << 48) + 12, "tms.ep"}, {1ull << 48, "rs"}, {10ull << 48, "dlna"}, {0xFFFFull << 48, nullptr}};
  for (const auto& [id, name] : cases) {
    const char* found = SarnUtil::GetNamespaceForId(id);
    EXPECT_EQ(found ? std::string(found) : "null", name ? name : "null") << std::hex << id;
  }
}

TEST(SarnUtilTest, EnumNamesAndNumbers) {
  EXPECT_EQ(Str(SarnUtil::EnumNumberToName(682, 2)) + "|" + Str(SarnUtil::EnumNumberToName(692, 0)) + "|" +
                Str(SarnUtil::EnumNumberToName(692, 6)) + "|" + Str(SarnUtil::EnumNumberToName(692, 7)) + "|" +
                Str(SarnUtil::EnumNumberToName(sarn::Schema::nEnumDefG, 0)) + "|" + Str(SarnUtil::EnumNumberToName(-1, 0)),
            "cable|sunday|saturday|||");
  unsigned int number = 0;
  EXPECT_TRUE(SarnUtil::EnumNameToNumber(682, VekString("cable"), number));
  EXPECT_EQ(number, 2u);
  number = 99;
  EXPECT_FALSE(SarnUtil::EnumNameToNumber(692, VekString(""), number));
  EXPECT_FALSE(SarnUtil::EnumNameToNumber(692, VekString("Sunday"), number));
  EXPECT_FALSE(SarnUtil::EnumNameToNumber(-1, VekString("cable"), number));
  EXPECT_FALSE(SarnUtil::EnumNameToNumber(sarn::Schema::nEnumDefG, VekString("cable"), number));
  EXPECT_EQ(number, 99u);
  // Unused numbers of an enum never match and have no name.
  for (int id = 0; id < sarn::Schema::nEnumDefG; ++id) {
    const sarn::EnumDef* def = sarn::Schema::vEnumDefG[id];
    for (uint64_t i = 0; def != nullptr && i < def->nValue; ++i) {
      ASSERT_TRUE(def->vName[i] != nullptr || SarnUtil::EnumNumberToName(id, static_cast<unsigned int>(i)).FEmpty())
          << id << " " << i;
    }
  }
}

TEST(SarnUtilTest, ObjectIdAndTypeText) {
  // Prefix, id, " - " and the type's name; no prefix for types without one; nothing for a type
  // id that names no type.
  EXPECT_EQ(Str(sarn::ObjectIdAndType(4294967295u, 191).ToString()), "vask:ds.4294967295 - address");
  EXPECT_EQ(Str(sarn::ObjectIdAndType(5, 543).ToString()), "5 - success");
  EXPECT_EQ(Str(sarn::ObjectIdAndType(0, 140).ToString()), "vask:ad.0 - ad");
  EXPECT_EQ(Str(sarn::ObjectIdAndType(5, 0xFFFF).ToString()), "");
  EXPECT_TRUE(sarn::ObjectIdAndType::nil == sarn::ObjectIdAndType() && sarn::ObjectIdAndType::nil.objectIdM == 0 &&
              sarn::ObjectIdAndType::nil.typeIdM == 0);
}

}  // namespace
