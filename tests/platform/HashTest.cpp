// String-keyed hash tables: keys compared by all their bytes, values replaced and released,
// growth keeping every entry reachable (interning is checked where the JSON reader uses it).
#include <map>
#include <string>

#include "testutil/TestUtil.h"

namespace {

struct Value : VekCore {
  explicit Value(int n) : nM(n) {}
  int nM;
};

using HashTest = sarntest::PoolTest;

VekString Key(VekMempool* pool, const std::string& text) { return VekString::FromUtf8Bytes(pool, text.size(), text.data()); }

TEST_F(HashTest, CoreTableHoldsAndReleasesReferences) {
  VekHashStringToCore<Value> table(&poolM);
  ref<Value> one = new (&poolM) Value(1);
  ref<Value> two = new (&poolM) Value(2);
  EXPECT_EQ(table.Find(Key(&poolM, "a")), nullptr) << "an empty table finds nothing";
  ASSERT_TRUE(table.Put(Key(&poolM, "a"), one) && table.Put(Key(&poolM, std::string("a\0b", 3)), two));
  EXPECT_TRUE(table.Count() == 2 && table.Find(Key(&poolM, "a")) == one.Get() && one->GetRefCount() == 2);
  EXPECT_TRUE(table.Find("a\0b", 3) == two.Get() && table.Find("a\0c", 3) == nullptr) << "keys differ after a NUL";

  ASSERT_TRUE(table.Put(Key(&poolM, "a"), two));  // replaces and releases the old value
  EXPECT_TRUE(table.Count() == 2 && one->GetRefCount() == 1 && two->GetRefCount() == 3);
  EXPECT_TRUE(table.Remove(Key(&poolM, "a")) && !table.Remove(Key(&poolM, "a")) && two->GetRefCount() == 2);
  table.Clear();
  EXPECT_TRUE(table.Count() == 0 && two->GetRefCount() == 1);
  EXPECT_TRUE(table.Put(Key(&poolM, ""), one) && table.Find(VekString()) == one.Get()) << "the empty key is a key";
}

TEST_F(HashTest, GrowthKeepsEveryEntryAndForEachVisitsEachOnce) {
  VekHashStringToStringNew table(&poolM);
  constexpr int kEntries = 5000;
  for (int i = 0; i < kEntries; ++i) {
    ASSERT_TRUE(table.Put(Key(&poolM, "key" + std::to_string(i)), Key(&poolM, "value" + std::to_string(i)))) << i;
  }
  EXPECT_EQ(table.Count(), static_cast<size_t>(kEntries));
  for (int i = 0; i < kEntries; i += 7) {
    std::string k = "key" + std::to_string(i);
    const VekString* v = table.Find(k.data(), k.size());
    ASSERT_TRUE(v != nullptr && *v == ("value" + std::to_string(i)).c_str()) << k;
  }
  std::map<std::string, std::string> seen;
  table.ForEach([&](const VekString& k, const VekString& v) {
    EXPECT_TRUE(seen.emplace(k.Utf8(), v.Utf8()).second) << "visited twice: " << k.Utf8();
  });
  EXPECT_TRUE(seen.size() == kEntries && seen["key4999"] == "value4999");
  // A second Put of a key replaces its value; a separate but equal key finds it.
  ASSERT_TRUE(table.Put(Key(&poolM, "key7"), Key(&poolM, "other")));
  EXPECT_TRUE(table.Count() == kEntries && *table.Find(Key(&poolM, "key7")) == "other");
}

}  // namespace
