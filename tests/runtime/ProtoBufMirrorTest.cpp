// The binary form is the protocol-buffer encoding, checked against a protocol-buffer library
// through the generated mirror: a bridge builds the library's message from one of our objects by
// reflection (every REQUIRED field set, so that the library writes it even at its default), and for
// filled and seeded random objects the library writes our bytes, and we read the library's bytes
// and write them back unchanged.
#include <google/protobuf/descriptor.h>
#include <gtest/gtest.h>

#include <string>

#include "mirror.pb.h"
#include "sarn/Sarn.h"
#include "testutil/ObjectFill.h"
#include "testutil/RandomObject.h"
#include "testutil/TestStreams.h"

using namespace sarn;
using google::protobuf::FieldDescriptor;
using google::protobuf::Message;
using google::protobuf::Reflection;

namespace {

const std::vector<unsigned> kMirrored = {346, 470, 543, 974, 1259};  // error ... testAllTypes

void Bridge(const SarnObject* object, Message* out);

void BridgeDict(Dict* dict, Message* entries) {  // AnyDict or AnyDictValue: entries = 4
  const FieldDescriptor* entryField = entries->GetDescriptor()->FindFieldByNumber(4);
  VekStringArray names(dict->GetMempool());
  dict->GetSortedNames(names);
  for (unsigned i = 0; i < names.Count(); ++i) {
    Message* entry = entries->GetReflection()->AddMessage(entries, entryField);
    const Reflection* r = entry->GetReflection();
    r->SetString(entry, entry->GetDescriptor()->FindFieldByNumber(6), names[i].Utf8());
    for (unsigned k = 0; k < dict->CountValues(names[i]); ++k) {
      Message* value = r->AddMessage(entry, entry->GetDescriptor()->FindFieldByNumber(8));
      if (dict->GetType(names[i], static_cast<int>(k)) == dictvalue::TYPE_STRING) {
        value->GetReflection()->SetString(value, value->GetDescriptor()->FindFieldByNumber(2),
                                          sarntest::Str(dict->GetString(names[i], static_cast<int>(k))));
      } else {
        BridgeDict(dict->GetDict(names[i], static_cast<int>(k)).Get(), value);
      }
    }
  }
}

void BridgeKnown(const SarnObject* object, Message* known) {
  const FieldDescriptor* field = known->GetDescriptor()->FindFieldByNumber(static_cast<int>(object->GetTypeId()));
  ASSERT_NE(field, nullptr) << "type " << object->GetTypeId() << " is not mirrored";
  Bridge(object, known->GetReflection()->MutableMessage(known, field));
}

// One value of `field` at `i` into the message field `fd` (added when repeated).
void BridgeValue(const SarnObject* object, const FieldInfo& field, unsigned i, Message* out, const FieldDescriptor* fd) {
  const Reflection* r = out->GetReflection();
  const bool isMulti = fd->is_repeated();
  auto put = [&](auto value, auto add, auto set) { isMulti ? (r->*add)(out, fd, value) : (r->*set)(out, fd, value); };
  auto text = [&](const VekString& s) { put(sarntest::Str(s), &Reflection::AddString, &Reflection::SetString); };
  switch (field.dataType) {
    case SARN_DATA_TYPE_BOOL:
      return put(FieldAccess::ScalarValue<uint8_t>(object, field, i) != 0, &Reflection::AddBool, &Reflection::SetBool);
    case SARN_DATA_TYPE_DATE:
    case SARN_DATA_TYPE_S32:
      return put(FieldAccess::ScalarValue<int32_t>(object, field, i), &Reflection::AddInt32, &Reflection::SetInt32);
    case SARN_DATA_TYPE_DATETIME:
    case SARN_DATA_TYPE_S64:
      return put(FieldAccess::ScalarValue<int64_t>(object, field, i), &Reflection::AddInt64, &Reflection::SetInt64);
    case SARN_DATA_TYPE_ENUM:
    case SARN_DATA_TYPE_TIME:
    case SARN_DATA_TYPE_INT_ID:
    case SARN_DATA_TYPE_U32:
      return put(FieldAccess::ScalarValue<uint32_t>(object, field, i), &Reflection::AddUInt32, &Reflection::SetUInt32);
    case SARN_DATA_TYPE_LONG_ID:
    case SARN_DATA_TYPE_U64:
      return put(FieldAccess::ScalarValue<uint64_t>(object, field, i), &Reflection::AddUInt64, &Reflection::SetUInt64);
    case SARN_DATA_TYPE_FLOAT:
      return put(FieldAccess::ScalarValue<double>(object, field, i), &Reflection::AddDouble, &Reflection::SetDouble);
    case SARN_DATA_TYPE_CHANNEL_NUMBER: return text(FieldAccess::ScalarValue<ChannelNumber>(object, field, i).ToString());
    case SARN_DATA_TYPE_CURRENCY: return text(FieldAccess::ScalarValue<Currency>(object, field, i).ToString());
    case SARN_DATA_TYPE_STRING:
    case SARN_DATA_TYPE_STRING_ID: return text(FieldAccess::StringAt(object, field, i));
    default: break;
  }
  VekCore* value = FieldAccess::ReferenceAt(object, field, i);
  if (field.dataType == SARN_DATA_TYPE_BYTESTRING) {
    return put(sarntest::Contents(*static_cast<const vek::ByteBuffer*>(value)), &Reflection::AddString, &Reflection::SetString);
  }
  Message* message = isMulti ? r->AddMessage(out, fd) : r->MutableMessage(out, fd);
  switch (field.dataType) {
    case SARN_DATA_TYPE_ANY_DICT: return BridgeDict(static_cast<Dict*>(value), message);
    case SARN_DATA_TYPE_SUBDICT: return Bridge(static_cast<SarnObject*>(value), message);
    case SARN_DATA_TYPE_KNOWN_DICT: return BridgeKnown(static_cast<SarnObject*>(value), message);
    case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY:
      return BridgeKnown(static_cast<LazyDict*>(value)->ToSarnObjectOrError().Get(), message);
    default: FAIL() << "data type " << field.dataType;
  }
}

void Bridge(const SarnObject* object, Message* out) {
  const StructInfo* info = object->GetStructInfo();
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const FieldInfo& field = info->vFieldInfo[n];
    if (field.arity == SARN_ARITY_NONE || field.dataType > SARN_DATA_TYPE_U64) continue;
    const FieldDescriptor* fd = out->GetDescriptor()->FindFieldByNumber(static_cast<int>(n));
    ASSERT_NE(fd, nullptr) << info->pName << " field " << n;
    bool isReference = FieldAccess::StorageOf(field.dataType) == FieldAccess::STORAGE_REFERENCE;
    unsigned count = field.arity == SARN_ARITY_MULTI ? FieldAccess::Count(object, field) : IsFieldPresent(object, field);
    for (unsigned i = 0; i < count; ++i) {
      if (!isReference || FieldAccess::ReferenceAt(object, field, i) != nullptr) BridgeValue(object, field, i, out, fd);
    }
  }
}

// As a known dict (tagged by type id), or only the fields.
std::string Marshal(const ProtoBuf& codec, const SarnObject* object, bool isKnown = true) {
  ProtoBufByteOutputStream out;
  isKnown ? codec.MarshalKnownDict(object, &out) : codec.Marshal(object, &out);
  return sarntest::Finished(out);
}

const unsigned char* Bytes(const std::string& s) { return reinterpret_cast<const unsigned char*>(s.data()); }

// The library writes our bytes from the bridged message, and (only when it can read back: a
// default object writes its REQUIRED channel numbers and currencies as "invalid", which we refuse
// to read) we read the library's bytes and write them back unchanged. The library reading our
// bytes into the same message follows from the first: its serialization is deterministic.
void ExpectAgreement(const ProtoBuf& codec, const SarnObject* object, const std::string& what,
                     bool isReadBack = true) {
  std::string ours = Marshal(codec, object);
  sarnmirror::KnownDict bridged;
  BridgeKnown(object, &bridged);
  ASSERT_EQ(bridged.SerializeAsString(), ours) << what;
  if (!isReadBack) return;
  ref<SarnObject> read;
  ASSERT_TRUE(codec.UnmarshalKnownDict(Bytes(ours), static_cast<int>(ours.size()), &read)) << what;
  EXPECT_EQ(Marshal(codec, read.Get()), ours) << what;
}

}  // namespace

TEST(ProtoBufMirrorTest, FilledAndRandomObjectsAgreeWithThePeerLibrary) {
  VekMempool pool("mirror");
  {
    ProtoBuf codec(&pool, Schema::vStructDefG, Schema::nStructDefG);
    for (unsigned typeId : kMirrored) {
      ref<SarnObject> defaults = StructInfoForId(typeId)->pFactory(&pool);
      ExpectAgreement(codec, defaults.Get(), "default " + std::to_string(typeId), false);
      for (unsigned seed : {1u, 2u}) {
        ref<SarnObject> filled = StructInfoForId(typeId)->pFactory(&pool);
        sarntest::FillObject(&pool, filled.Get(), seed, 2, seed);
        ExpectAgreement(codec, filled.Get(), "filled " + std::to_string(typeId));
      }
    }
    sarntest::RandomObjects random(&pool, 2026, kMirrored);
    for (int n = 0; n < 1000; ++n) {
      ref<SarnObject> object = random.MakeKnown();
      ExpectAgreement(codec, object.Get(), "random object " + std::to_string(n));
      if (HasFatalFailure()) return;
    }
  }
  EXPECT_EQ(pool.GetLiveBlocks(), 0u);
}

// Where the library merges a singular sub-object given twice, we keep the later one. (Other
// departures, such as packed arrays and 32-bit varints of ten bytes, are refusals of our reader
// kept with its other refusals.)
TEST(ProtoBufMirrorTest, ASubObjectGivenTwiceKeepsTheLater) {
  VekMempool pool("departures");
  ProtoBuf codec(&pool, Schema::vStructDefG, Schema::nStructDefG);
  std::string twice("\xba\x03\x03\x0a\x01\x61\xba\x03\x00", 9);  // struct (55) {message "a"}, then struct {}
  sarnmirror::TestAllTypes peer;
  EXPECT_TRUE(peer.ParseFromString(twice) && peer.struct_().has_message());
  ref<SarnObject> read;
  ASSERT_TRUE(codec.Unmarshal(Bytes(twice), static_cast<int>(twice.size()), 1259, &read));
  sarnmirror::TestAllTypes ours;
  EXPECT_TRUE(ours.ParseFromString(Marshal(codec, read.Get(), false)) && !ours.struct_().has_message());
}
