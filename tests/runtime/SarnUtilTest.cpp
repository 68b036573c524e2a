#include <string>
#include <tuple>
#include <vector>

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

// The schema's lookups and their text forms agree: the name of a number (none for unused numbers,
// numbers past nValue, ids past the table and type ids), the number of a name (untouched when
// refused).
TEST(SarnUtilTest, EnumNamesAndNumbers) {
  const std::pair<long, unsigned> numbers[] = {{682, 2}, {692, 0}, {692, 6}, {692, 7}, {702, 0}, {714, 3},
                                               {sarn::Schema::nEnumDefG, 0}, {-1, 0}, {191, 0}};
  std::string names;
  for (const auto& [id, n] : numbers) {
    const char* name = sarn::EnumNumberName(id, n);
    names += std::string(name != nullptr ? name : "") + "|";
    EXPECT_EQ(Str(SarnUtil::EnumNumberToName(static_cast<int>(id), n)), name != nullptr ? name : "") << id;
  }
  EXPECT_EQ(names, "cable|sunday|saturday|||||||");
  const std::tuple<long, const char*, unsigned> lookups[] = {
      {682, "cable", 2}, {714, "high", 2}, {1361, "address", 191}, {692, "", 99}, {692, "Sunday", 99},
      {714, "huge", 99}, {-1, "cable", 99}, {sarn::Schema::nEnumDefG, "cable", 99}};
  for (const auto& [id, name, expected] : lookups) {
    unsigned int number = 99, viaText = 99;
    bool isFound = sarn::EnumNameNumber(id, name, number);
    EXPECT_EQ(std::vector<unsigned>({isFound, SarnUtil::EnumNameToNumber(static_cast<int>(id), VekString(name), viaText), number, viaText}),
              std::vector<unsigned>({expected != 99, expected != 99, expected, expected})) << name;
  }
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
  EXPECT_EQ(Str(sarn::ObjectIdAndType(4294967295u, 191).ToString()) + "|" + Str(sarn::ObjectIdAndType(5, 543).ToString()) +
                "|" + Str(sarn::ObjectIdAndType(0, 140).ToString()) + "|" + Str(sarn::ObjectIdAndType(5, 0xFFFF).ToString()),
            "vask:ds.4294967295 - address|5 - success|vask:ad.0 - ad|");
  EXPECT_TRUE(sarn::ObjectIdAndType::nil == sarn::ObjectIdAndType() && sarn::ObjectIdAndType::nil.objectIdM == 0 &&
              sarn::ObjectIdAndType::nil.typeIdM == 0);
}

}  // namespace
