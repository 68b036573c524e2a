// Objects in and out: JSON text to a typed object and back, the binary form, a refusal with its
// message, and a pool that is empty again at the end. Build it beside the library or on its own
// against an installed tree (find_package(sarn)).
#include <cstdio>

#include "sarn/Sarn.h"

int main() {
  //! [pool]
  // Every allocation names a pool; objects remember theirs and return their bytes to it when
  // their last reference goes. The pool must outlive everything made in it.
  VekMempool pool("objects");
  int status = 0;
  {
    //! [pool]
    //! [convert]
    // JSON text to a tree of named values, then to a typed object at schema version 42.
    const char json[] =
        "{\"type\": \"address\", \"city\": \"Oslo\", \"country\": \"NO\", \"levelOfDetail\": \"high\", "
        "\"postalCode\": \"0150\", \"state\": \"\", \"street1\": \"Main St 1\"}";
    VekString error;
    ref<sarn::Dictionary> tree =
        sarn::Dictionary::FromJson(reinterpret_cast<const unsigned char*>(json), sizeof json - 1, error, &pool);
    sarn::DictionarySarnObject converter(&pool, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG);
    ref<sarn::SarnObject> object;
    if (!tree || !converter.DictionaryToSarnObject(tree, 42, object, error)) {
      std::fprintf(stderr, "refused: %s\n", error.Utf8());
      return 1;
    }
    auto* address = static_cast<sarnschema::Address*>(object.Get());
    std::printf("a %s in %s\n", object->GetTypeName().Utf8(), address->cityM.Utf8());

    // Back to compact JSON, as it goes on the wire.
    sarn::JsonSarnObject writer(&pool);
    std::printf("%s\n", writer.SarnObjectToJson(object.Get(), 42).Utf8());

    // The binary form: the type id, then the fields; read back into an equal object.
    sarn::ProtoBuf binary(&pool, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG);
    sarn::ProtoBufByteOutputStream stream;
    binary.MarshalKnownDictValue(object.Get(), &stream);
    const unsigned char* bytes = nullptr;
    unsigned long length = 0;
    stream.Finish(bytes, length);
    ref<sarn::SarnObject> copy;
    if (stream.IsOutOfMemory() || !binary.UnmarshalKnownDict(bytes, static_cast<int>(length), &copy)) return 1;
    std::printf("%lu bytes, read back: %s\n", length, writer.SarnObjectToJson(copy.Get(), 42).Utf8());
    //! [convert]

    //! [errors]
    // Failures are return values with a message, never exceptions. Readers bound what they take
    // (sarn/base/Limits.h); a caller may tighten a bound for one call.
    const char deep[] = "{\"type\": \"address\", \"x\": {\"y\": {\"z\": {}}}}";
    VekString refusal;
    ref<sarn::Dictionary> refused = sarn::Dictionary::FromJson(reinterpret_cast<const unsigned char*>(deep),
                                                               sizeof deep - 1, refusal, &pool, sarn::Limits(3));
    std::printf("with a depth limit of 3: %s\n", refused ? "read" : refusal.Utf8());
    tree->Remove(VekString::FromUtf8Bytes(&pool, 4, "city"));
    VekString missing;
    ref<sarn::SarnObject> incomplete;
    if (!converter.DictionaryToSarnObject(tree, 42, incomplete, missing)) {
      std::printf("without a city: %s\n", missing.Utf8());
    } else {
      status = 1;
    }
    //! [errors]
  }
  //! [release]
  // Every reference has gone out of scope: the pool holds nothing any more.
  std::printf("bytes in use: %zu\n", pool.GetUsedBytes());
  return pool.GetUsedBytes() == 0 ? status : 1;
  //! [release]
}
