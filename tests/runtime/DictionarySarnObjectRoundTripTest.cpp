// Round trips through text: an object with every field set, written as JSON, read into a
// Dictionary and converted back, writes the same text; so does the object's own Dictionary and the
// Dictionary's JSON.
#include <gtest/gtest.h>

#include <string>

#include "sarn/Sarn.h"
#include "testutil/ObjectFill.h"
#include "testutil/TestUtil.h"

namespace {

using namespace sarn;

class RoundTripTest : public sarntest::PoolTest {
 protected:
  std::string Json(const SarnObject* object, KernoVersion version) {
    JsonSarnObject json(&poolM);
    VekString text = json.SarnObjectToJson(object, version);
    return std::string(text.Utf8(), text.NByte());
  }
  ref<SarnObject> FromText(const std::string& text, KernoVersion version) {
    VekString error;
    ref<Dictionary> tree = Dictionary::FromJson(reinterpret_cast<const unsigned char*>(text.data()), text.size(),
                                                error, &poolM);
    EXPECT_TRUE(tree != nullptr) << error.Utf8();
    if (tree == nullptr) return nullptr;
    return FromTree(tree, version);
  }
  ref<SarnObject> FromTree(const ref<Dictionary>& tree, KernoVersion version) {
    DictionarySarnObject converter(&poolM, Schema::vStructDefG, Schema::nStructDefG);
    ref<SarnObject> object;
    VekString error;
    EXPECT_TRUE(converter.DictionaryToSarnObject(tree, version, object, error)) << error.Utf8();
    return object;
  }
  void ExpectRoundTrips(const SarnObject* object, KernoVersion version) {
    std::string text = Json(object, version);
    ref<SarnObject> viaJson = FromText(text, version);
    ASSERT_TRUE(viaJson != nullptr);
    EXPECT_EQ(Json(viaJson.Get(), version), text);

    DictionarySarnObject converter(&poolM, Schema::vStructDefG, Schema::nStructDefG);
    ref<Dictionary> tree = converter.SarnObjectToDictionary(object, version);
    ref<SarnObject> viaTree = FromTree(tree, version);
    ASSERT_TRUE(viaTree != nullptr);
    EXPECT_EQ(Json(viaTree.Get(), version), text);

    VekString treeText = tree->ToJson(false);
    ref<SarnObject> viaTreeText = FromText(std::string(treeText.Utf8(), treeText.NByte()), version);
    ASSERT_TRUE(viaTreeText != nullptr);
    EXPECT_EQ(Json(viaTreeText.Get(), version), text);
  }
};

TEST_F(RoundTripTest, TestAllTypesWithEveryFieldSet) {
  ref<SarnObject> object = sarnschema::TestAllTypes::Factory(&poolM);
  sarntest::FillObject(&poolM, object.Get(), 1, 3);
  std::string text = Json(object.Get(), 0);
  // Every field is there: 78 members, "type", and the nested objects' members.
  EXPECT_NE(text.find("\"anyDictMulti\": [{\"key\": \"value\", \"n\": \"1\"},{\"key\": \"value\", \"n\": \"1\"}]"),
            std::string::npos)
      << text;
  EXPECT_NE(text.find("\"idAnyBodyOptional\": \"Text "), std::string::npos) << text;
  ExpectRoundTrips(object.Get(), 0);
}

TEST_F(RoundTripTest, FilledSchemaTypesAtTheirVersions) {
  for (unsigned id : {191u, 219u, 346u, 463u, 470u, 975u, 2416u}) {
    const StructInfo* info = StructInfoForId(id);
    ASSERT_TRUE(info != nullptr) << id;
    ref<SarnObject> object = info->pFactory(&poolM);
    sarntest::FillObject(&poolM, object.Get(), id, 2);
    // The JSON writer does not consult older records and the Dictionary reader does, so JSON read
    // at a version that an older required record covers can miss that field: versions after them.
    for (KernoVersion version : {0, 30, 42}) {
      SCOPED_TRACE(std::string(info->pName) + " at " + std::to_string(version));
      ExpectRoundTrips(object.Get(), version);
    }
  }
}

}  // namespace
