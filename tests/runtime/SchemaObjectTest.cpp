// Generated objects: arrays of fresh objects, presence, release of what an object holds, debug lock ids.
#include <vector>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

using namespace sarn;

namespace {

class SchemaObjectTest : public sarntest::PoolTest {};
const auto& Field = sarntest::FieldNamed;

}  // namespace

// Scalar defaults, null references and empty arrays show in the writer's text of a fresh object;
// what the text cannot show is each array's element width and pool.
TEST_F(SchemaObjectTest, ArraysOfFreshObjects) {
  ref<SarnObject> allObject = sarnschema::TestAllTypes::Factory(&poolM);
  auto* all = static_cast<sarnschema::TestAllTypes*>(allObject.Get());
  EXPECT_EQ(std::vector<int>({all->booleanMultiM.GetWidth(), all->enumMultiM.GetWidth(), all->dateMultiM.GetWidth(),
                              all->channelNumberMultiM.GetWidth(), all->currencyMultiM.GetWidth(),
                              all->longMultiM.GetWidth()}),
            std::vector<int>({1, 4, 4, 8, 8, 8}));
  EXPECT_TRUE(all->booleanMultiM.GetMempool() == &poolM && all->stringMultiM.GetMempool() == &poolM &&
              all->structMultiM.GetMempool() == &poolM);
}

TEST_F(SchemaObjectTest, PresenceFollowsFlagsOrReferences) {
  ref<SarnObject> object = sarnschema::TestAllTypes::Factory(&poolM);
  auto* all = static_cast<sarnschema::TestAllTypes*>(object.Get());
  const StructInfo* info = object->GetStructInfo();
  const FieldInfo& stringOptional = Field(info, "stringOptional");
  const FieldInfo& structOptional = Field(info, "structOptional");
  all->stringOptionalM = VekString("not flagged");
  EXPECT_FALSE(IsFieldPresent(object.Get(), stringOptional)) << "a string without its flag is absent";
  MarkFieldPresent(object.Get(), stringOptional);
  EXPECT_TRUE(all->fHasStringOptionalM && IsFieldPresent(object.Get(), stringOptional));
  EXPECT_TRUE(structOptional.flagOffset == 0 && !IsFieldPresent(object.Get(), structOptional));
  all->structOptionalM = sarnschema::Success::Factory(&poolM);
  EXPECT_TRUE(IsFieldPresent(object.Get(), structOptional));
  EXPECT_TRUE(IsFieldPresent(object.Get(), Field(info, "string")) && !IsFieldPresent(object.Get(), info->vFieldInfo[0]))
      << "required fields are always there, placeholders never";
  // The field-access layer reaches the same storage as the members.
  FieldRef<int32_t>(object.Get(), Field(info, "int")) = 42;
  EXPECT_EQ(all->intM, 42);
}

TEST_F(SchemaObjectTest, ReleasingAnObjectReleasesWhatItHolds) {
  ref<SarnObject> cause = sarnschema::Success::Factory(&poolM);
  ref<SarnObject> nested = sarnschema::Address::Factory(&poolM);
  {
    ref<SarnObject> errorObject = sarnschema::Error::Factory(&poolM);
    auto* error = static_cast<sarnschema::Error*>(errorObject.Get());
    error->causeM = cause;
    error->textM = VekString::Format(&poolM, "held %d", 1);
    ref<SarnObject> allObject = sarnschema::TestAllTypes::Factory(&poolM);
    auto* all = static_cast<sarnschema::TestAllTypes*>(allObject.Get());
    all->structMultiM.Add(nested.Get());
    all->unionM = nested;
    all->stringMultiM.Add(VekString::Format(&poolM, "%s", "one"));
    all->idBodyMultiM.Add(VekString::Format(&poolM, "%s", "two"));
    int64_t value = 7;
    all->longMultiM.Add(&value);
    all->bytestringM = vek::ByteBuffer::New(&poolM);
    EXPECT_TRUE(cause->GetRefCount() == 2 && nested->GetRefCount() == 3);
  }
  EXPECT_TRUE(cause->GetRefCount() == 1 && nested->GetRefCount() == 1);
}

TEST_F(SchemaObjectTest, SetDebugLockOwnerReachesStringArrays) {
  ref<SarnObject> object = sarnschema::Account::Factory(&poolM);
  object->SetDebugLockOwner(77);
  EXPECT_EQ(static_cast<sarnschema::Account*>(object.Get())->bodyIdM.GetDebugLockOwner(), 77u);
  ref<SarnObject> all = sarnschema::TestAllTypes::Factory(&poolM);
  all->SetDebugLockOwner(5);
  int arrays = 0;
  for (unsigned n = 0; n < all->GetStructInfo()->nFieldInfo; ++n) {
    const FieldInfo& f = all->GetStructInfo()->vFieldInfo[n];
    if (f.arity != SARN_ARITY_MULTI || (f.dataType != SARN_DATA_TYPE_STRING && f.dataType != SARN_DATA_TYPE_STRING_ID)) continue;
    EXPECT_EQ(FieldRef<VekStringArray>(all.Get(), f).GetDebugLockOwner(), 5u) << n;
    ++arrays;
  }
  EXPECT_EQ(arrays, 9);
}
