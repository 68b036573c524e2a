// The protocol-buffer reader on arbitrary bytes. Byte 0 picks the entry point (known-dict value,
// version-1 envelope, any-dict); the rest is the input.
// Oracles: the readers never crash or leak; for an object that reads, writing it, reading that
// back and writing again gives the same bytes, unless the object holds a REQUIRED channel number
// or currency left invalid (written as "invalid", which the reader refuses); an envelope reader
// never returns null; a dictionary that reads writes back to bytes that read to the same text.
// Standard output (where unknown field numbers are reported) is silenced.
#include <cstdio>

#include "DictFuzzSupport.h"

namespace {

using sarntest::Require;
using sarntest::Finished;
using sarntest::KnownDictBytes;

// A REQUIRED channel number or currency at INVALID anywhere in the object or the objects it holds.
bool HoldsInvalidRequired(const sarn::SarnObject* object) {
  using namespace sarn;
  return dictfuzz::AnyField(object, [](const SarnObject* o, const FieldInfo& field) {
    return field.arity == SARN_ARITY_REQUIRED &&
           ((field.dataType == SARN_DATA_TYPE_CHANNEL_NUMBER && FieldAccess::ScalarValue<ChannelNumber>(o, field, 0) == ChannelNumber::INVALID) ||
            (field.dataType == SARN_DATA_TYPE_CURRENCY && FieldAccess::ScalarValue<Currency>(o, field, 0) == Currency::INVALID));
  });
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
        std::string bytes = KnownDictBytes(&pool, object.Get());
        ref<sarn::SarnObject> again;
        if (!codec.UnmarshalKnownDict(reinterpret_cast<const unsigned char*>(bytes.data()),
                                      static_cast<int>(bytes.size()), &again)) {
          Require(HoldsInvalidRequired(object.Get()));
          break;
        }
        Require(KnownDictBytes(&pool, again.Get()) == bytes);
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
