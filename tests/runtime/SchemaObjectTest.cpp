// Generated objects: factories, defaults, presence, release of what an object holds, debug lock ids.
#include <cstring>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

using namespace sarn;

namespace {

class SchemaObjectTest : public sarntest::PoolTest {};

const FieldInfo& Field(const StructInfo* info, const char* name) {
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    if (info->vFieldInfo[n].arity != SARN_ARITY_NONE && std::strcmp(FieldName(info, info->vFieldInfo[n]), name) == 0) {
      return info->vFieldInfo[n];
    }
  }
  ADD_FAILURE() << "no field " << name;
  return info->vFieldInfo[0];
}

}  // namespace

TEST_F(SchemaObjectTest, EveryFactoryMakesItsTypeAndReleasesIt) {
  int made = 0;
  for (int id = 0; id < Schema::nStructDefG; ++id) {
    const StructInfo* info = Schema::vStructDefG[id];
    if (info == nullptr) continue;
    const StructInfo* byName = StructInfoMap::LookupStructByName(info->pName);
    ASSERT_EQ(byName, info);
    ref<SarnObject> object = byName->pFactory(&poolM);
    ASSERT_TRUE(object) << info->pName;
    EXPECT_EQ(object->GetRefCount(), 1u);
    EXPECT_EQ(object->GetTypeId(), static_cast<uint32_t>(id));
    EXPECT_EQ(object->GetMempool(), &poolM);
    EXPECT_EQ(object->GetStructInfo(), info);
    EXPECT_TRUE(object->GetTypeName() == info->pName) << info->pName;
    // A fresh object has every optional field absent.
    for (unsigned n = 0; n < info->nFieldInfo; ++n) {
      const FieldInfo& f = info->vFieldInfo[n];
      if (f.arity == SARN_ARITY_OPTIONAL) {
        EXPECT_FALSE(IsFieldPresent(object.Get(), f)) << info->pName << " " << n;
      }
    }
    ++made;
  }
  EXPECT_EQ(made, 1272);
  ref<SarnObject> address = sarnschema::Address::Factory(&poolM);
  EXPECT_TRUE(address->GetTypeName() == "address");
  ref<SarnObject> request = sarnschema::KernoRpcRequest::Factory(&poolM);
  EXPECT_TRUE(request->GetTypeName() == "kernoRpcRequest");
  EXPECT_EQ(sarnschema::TestAllTypes::TYPE_ID, 1259u);
  EXPECT_EQ(sarnschema::Ad::Factory(&poolM)->GetTypeId(), 140u);
}

TEST_F(SchemaObjectTest, DefaultsOfFreshObjects) {
  ref<SarnObject> object = sarnschema::ChannelIdentifier::Factory(&poolM);
  auto* channel = static_cast<sarnschema::ChannelIdentifier*>(object.Get());
  EXPECT_EQ(channel->channelNumberM.majorM, -2);
  EXPECT_EQ(channel->channelNumberM.minorM, -2);
  EXPECT_TRUE(channel->channelNumberM == ChannelNumber::INVALID);
  EXPECT_FALSE(channel->fHasChannelNumberM || channel->fHasSourceTypeM || channel->fHasStationIdM ||
               channel->fHasPartnerStationIdM);
  EXPECT_EQ(channel->sourceTypeM, 0u);
  EXPECT_EQ(channel->stationIdM, 0u);
  EXPECT_TRUE(channel->partnerStationIdM.FEmpty());

  ref<SarnObject> allObject = sarnschema::TestAllTypes::Factory(&poolM);
  auto* all = static_cast<sarnschema::TestAllTypes*>(allObject.Get());
  const unsigned char* bytes = reinterpret_cast<const unsigned char*>(all);
  for (int flag = 24; flag <= 44; ++flag) EXPECT_EQ(bytes[flag], 0) << "flag byte " << flag;
  EXPECT_FALSE(all->anyDictM || all->knownDictM || all->structM || all->unionM || all->bytestringM);
  EXPECT_FALSE(all->anyDictOptionalM || all->knownDictOptionalM || all->structOptionalM || all->unionOptionalM ||
               all->bytestringOptionalM);
  EXPECT_EQ(all->anyDictMultiM.Count() + all->booleanMultiM.Count() + all->stringMultiM.Count() +
                all->structMultiM.Count() + all->channelNumberMultiM.Count() + all->dateTimeMultiM.Count(),
            0);
  EXPECT_EQ(all->booleanMultiM.GetWidth(), 1);
  EXPECT_EQ(all->enumMultiM.GetWidth(), 4);
  EXPECT_EQ(all->dateMultiM.GetWidth(), 4);
  EXPECT_EQ(all->channelNumberMultiM.GetWidth(), 8);
  EXPECT_EQ(all->currencyMultiM.GetWidth(), 8);
  EXPECT_EQ(all->longMultiM.GetWidth(), 8);
  EXPECT_EQ(all->booleanMultiM.GetMempool(), &poolM);
  EXPECT_EQ(all->stringMultiM.GetMempool(), &poolM);
  EXPECT_EQ(all->structMultiM.GetMempool(), &poolM);
  EXPECT_FALSE(all->booleanM);
  EXPECT_EQ(all->intM, 0);
  EXPECT_EQ(all->longM, 0);
  EXPECT_EQ(all->floatM, 0.0);
  EXPECT_EQ(all->idIntM, 0u);
  EXPECT_EQ(all->idLongM, 0u);
  EXPECT_EQ(all->enumM, 0u);
  EXPECT_EQ(all->dateM.daysM, 0);
  EXPECT_EQ(all->timeM.millisecondsM, 0);
  EXPECT_EQ(all->dateTimeM.millisecondsM, 0);
  EXPECT_TRUE(all->currencyM == Currency::INVALID);
  EXPECT_TRUE(all->channelNumberM == ChannelNumber::INVALID);
  EXPECT_TRUE(all->stringM.FEmpty() && all->idStringM.FEmpty());
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
  EXPECT_TRUE(all->fHasStringOptionalM);
  EXPECT_TRUE(IsFieldPresent(object.Get(), stringOptional));
  EXPECT_EQ(structOptional.flagOffset, 0);
  EXPECT_FALSE(IsFieldPresent(object.Get(), structOptional));
  all->structOptionalM = sarnschema::Success::Factory(&poolM);
  EXPECT_TRUE(IsFieldPresent(object.Get(), structOptional));
  EXPECT_TRUE(IsFieldPresent(object.Get(), Field(info, "string"))) << "required fields are always there";
  EXPECT_FALSE(IsFieldPresent(object.Get(), info->vFieldInfo[0]));
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
    EXPECT_EQ(cause->GetRefCount(), 2u);

    ref<SarnObject> allObject = sarnschema::TestAllTypes::Factory(&poolM);
    auto* all = static_cast<sarnschema::TestAllTypes*>(allObject.Get());
    all->structMultiM.Add(nested.Get());
    all->unionM = nested;
    all->stringMultiM.Add(VekString::Format(&poolM, "%s", "one"));
    all->idBodyMultiM.Add(VekString::Format(&poolM, "%s", "two"));
    int64_t value = 7;
    all->longMultiM.Add(&value);
    all->bytestringM = vek::ByteBuffer::New(&poolM);
    EXPECT_EQ(nested->GetRefCount(), 3u);
  }
  EXPECT_EQ(cause->GetRefCount(), 1u);
  EXPECT_EQ(nested->GetRefCount(), 1u);
}

TEST_F(SchemaObjectTest, SetDebugLockOwnerReachesStringArrays) {
  ref<SarnObject> object = sarnschema::Account::Factory(&poolM);
  auto* account = static_cast<sarnschema::Account*>(object.Get());
  object->SetDebugLockOwner(77);
  EXPECT_EQ(account->bodyIdM.GetDebugLockOwner(), 77u);
  ref<SarnObject> all = sarnschema::TestAllTypes::Factory(&poolM);
  all->SetDebugLockOwner(5);
  auto* a = static_cast<sarnschema::TestAllTypes*>(all.Get());
  EXPECT_EQ(a->stringMultiM.GetDebugLockOwner(), 5u);
  EXPECT_EQ(a->idStringMultiM.GetDebugLockOwner(), 5u);
  EXPECT_EQ(a->uriMultiM.GetDebugLockOwner(), 5u);
  ref<SarnObject> ad = sarnschema::Ad::Factory(&poolM);
  ad->SetDebugLockOwner(9);  // only the base: Ad has no string arrays
}

TEST(SchemaEnums, NamesAndNumbers) {
  EXPECT_STREQ(EnumNumberName(682, 2), "cable");
  EXPECT_EQ(EnumNumberName(702, 0), nullptr) << "unused number";
  EXPECT_EQ(EnumNumberName(714, 3), nullptr) << "number beyond nValue";
  EXPECT_EQ(EnumNumberName(Schema::nEnumDefG, 0), nullptr);
  EXPECT_EQ(EnumNumberName(-1, 0), nullptr);
  EXPECT_EQ(EnumNumberName(191, 0), nullptr) << "a type id is no enum";
  unsigned int number = 1234;
  EXPECT_FALSE(EnumNameNumber(714, "huge", number));
  EXPECT_EQ(number, 1234u);
  EXPECT_TRUE(EnumNameNumber(714, "high", number));
  EXPECT_EQ(number, 2u);
  EXPECT_TRUE(EnumNameNumber(1361, "address", number));
  EXPECT_EQ(number, 191u);
  EXPECT_FALSE(EnumNameNumber(Schema::nEnumDefG, "high", number));
}
