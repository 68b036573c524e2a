// The protocol-buffer reader on arbitrary bytes. Byte 0 picks the entry point (known-dict value,
// version-1 envelope, any-dict); the rest is the input.
// Oracles: the readers never crash or leak; for an object that reads, writing it, reading that
// back and writing again gives the same bytes, unless the object holds a REQUIRED channel number
// or currency left invalid (written as "invalid", which the reader refuses); an envelope reader
// never returns null; a dictionary that reads writes back to bytes that read to the same text.
// Standard output (where unknown field numbers are reported) is silenced.
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "sarn/Sarn.h"
#include "../tests/testutil/TestStreams.h"

namespace {

using sarntest::Require;
using sarntest::Finished;

// A REQUIRED channel number or currency at INVALID anywhere in the object or the objects it holds.
bool HoldsInvalidRequired(const sarn::SarnObject* object) {
  using namespace sarn;
  const StructInfo* info = object != nullptr ? object->GetStructInfo() : nullptr;
  if (info == nullptr) return false;
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const FieldInfo& field = info->vFieldInfo[n];
    if (field.arity == SARN_ARITY_REQUIRED && field.dataType == SARN_DATA_TYPE_CHANNEL_NUMBER &&
        FieldAccess::ScalarValue<ChannelNumber>(object, field, 0) == ChannelNumber::INVALID) {
      return true;
    }
    if (field.arity == SARN_ARITY_REQUIRED && field.dataType == SARN_DATA_TYPE_CURRENCY &&
        FieldAccess::ScalarValue<Currency>(object, field, 0) == Currency::INVALID) {
      return true;
    }
    if (field.arity == SARN_ARITY_NONE ||
        (field.dataType != SARN_DATA_TYPE_KNOWN_DICT && field.dataType != SARN_DATA_TYPE_SUBDICT)) {
      continue;
    }
    for (unsigned i = 0; i < FieldAccess::Count(object, field); ++i) {
      if (HoldsInvalidRequired(static_cast<const SarnObject*>(FieldAccess::ReferenceAt(object, field, i)))) return true;
    }
  }
  return false;
}

std::string Marshal(const sarn::ProtoBuf& codec, const ref<sarn::SarnObject>& object) {
  sarn::ProtoBufByteOutputStream out;
  codec.MarshalKnownDict(object.Get(), &out);
  return Finished(out);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static bool isSilenced = std::freopen("/dev/null", "w", stdout) != nullptr;
  (void)isSilenced;
  if (size < 1 || size > 1 << 16) return 0;
  VekMempool pool("fuzz");
  {
    sarn::ProtoBuf codec(&pool, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG);
    const unsigned char* input = data + 1;
    int length = static_cast<int>(size - 1);
    switch (data[0] % 3) {
      case 0: {
        // What was read, written, read back and written again gives the same bytes: the written
        // form is a fixed point.
        ref<sarn::SarnObject> object;
        if (!codec.UnmarshalKnownDict(input, length, &object)) break;
        std::string bytes = Marshal(codec, object);
        ref<sarn::SarnObject> again;
        if (!codec.UnmarshalKnownDict(reinterpret_cast<const unsigned char*>(bytes.data()),
                                      static_cast<int>(bytes.size()), &again)) {
          Require(HoldsInvalidRequired(object.Get()));
          break;
        }
        Require(Marshal(codec, again) == bytes);
        break;
      }
      case 1:
        Require(static_cast<bool>(codec.UnmarshalWrapper(input, length)));
        break;
      default: {
        const unsigned char* cursor = input;
        ref<sarn::Dict> dict;
        if (!codec.UnmarshalAnyDict(&cursor, input + length, &dict)) break;
        sarn::ProtoBufByteOutputStream out;
        codec.MarshalAnyDict(dict.Get(), &out);
        std::string bytes = Finished(out);
        const unsigned char* again = reinterpret_cast<const unsigned char*>(bytes.data());
        ref<sarn::Dict> dict2;
        Require(codec.UnmarshalAnyDict(&again, again + bytes.size(), &dict2));
        Require(dict2->ToString(false).FEqual(dict->ToString(false)));
        break;
      }
    }
  }
  Require(pool.GetLiveBlocks() == 0);
  return 0;
}
