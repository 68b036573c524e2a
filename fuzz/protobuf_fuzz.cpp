// The protocol-buffer reader on arbitrary bytes. Byte 0 picks the entry point (known-dict value,
// version-1 envelope, any-dict); the rest is the input.
// Oracles: the readers never crash or leak; an object or dictionary that reads writes back to
// bytes that read again to the same JSON text; an envelope reader never returns null.
#include <cstdint>
#include <cstdlib>
#include <string>

#include "sarn/Sarn.h"

namespace {

void Check(bool condition) {
  if (!condition) std::abort();
}

std::string Finished(sarn::ProtoBufByteOutputStream& out) {
  const unsigned char* data;
  unsigned long length;
  out.Finish(data, length);
  return std::string(reinterpret_cast<const char*>(data), length);
}

std::string Json(VekMempool* pool, const ref<sarn::SarnObject>& object) {
  sarn::JsonSarnObject writer(pool);
  VekString text = writer.SarnObjectToJson(object.Get(), 0);
  return std::string(text.Utf8(), text.NByte());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 1 || size > 1 << 16) return 0;
  VekMempool pool("fuzz");
  {
    sarn::ProtoBuf codec(&pool, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG);
    const unsigned char* input = data + 1;
    int length = static_cast<int>(size - 1);
    switch (data[0] % 3) {
      case 0: {
        ref<sarn::SarnObject> object;
        if (!codec.UnmarshalKnownDict(input, length, &object)) break;
        sarn::ProtoBufByteOutputStream out;
        codec.MarshalKnownDict(object.Get(), &out);
        std::string bytes = Finished(out);
        ref<sarn::SarnObject> again;
        Check(codec.UnmarshalKnownDict(reinterpret_cast<const unsigned char*>(bytes.data()),
                                       static_cast<int>(bytes.size()), &again));
        Check(Json(&pool, again) == Json(&pool, object));
        break;
      }
      case 1:
        Check(static_cast<bool>(codec.UnmarshalWrapper(input, length)));
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
        Check(codec.UnmarshalAnyDict(&again, again + bytes.size(), &dict2));
        Check(dict2->ToString(false).FEqual(dict->ToString(false)));
        break;
      }
    }
  }
  Check(pool.GetLiveBlocks() == 0);
  return 0;
}
