// Names are written in byte order (a name before the longer names it starts), whatever the
// order they were added in and however many there are: a property against std::string's order
// over names that share long prefixes, start one another and differ only past eight bytes.
#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <set>
#include <string>

#include "runtime/DictTestSupport.h"

namespace {

using namespace dicttest;

TEST(DictionaryOrderTest, WritesNamesInByteOrderAtEverySize) {
  std::mt19937 random(7);
  for (size_t nName : {3u, 17u, 300u, 3000u}) {
    for (const char* alphabet : {"ab", "0123456789~", "aZ~9"}) {
      std::set<std::string> names;
      std::uniform_int_distribution<size_t> length(1, 12), pick(0, std::strlen(alphabet) - 1);
      while (names.size() < nName) {
        std::string name;
        for (size_t n = length(random); n > 0; --n) name += alphabet[pick(random)];
        names.insert(name);
      }
      std::vector<std::string> added(names.begin(), names.end());
      std::shuffle(added.begin(), added.end(), random);
      VekMempool pool("order");
      {
        ref<Dictionary> dictionary = Dictionary::New(&pool, VekString());
        for (const std::string& name : added) ASSERT_TRUE(dictionary->Add(Text(&pool, name), Text(&pool, name)));
        std::string expected = "{";
        for (const std::string& name : names) expected += (expected.size() > 1 ? ", \"" : "\"") + name + "\": \"" + name + "\"";
        EXPECT_EQ(Str(dictionary->ToJson(false)), expected + "}") << nName << " names of " << alphabet;
      }
    }
  }
}

}  // namespace
