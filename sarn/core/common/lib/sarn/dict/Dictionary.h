// Dictionary: the schema-less tree's container, a table from names to values that can hold
// several values under one name (kept in the order they were added), and the entry points of
// the two JSON readers that build it.
//
// Storage: the entries (name, value) sit in one array in insertion order; values of one name are
// chained. Small dictionaries are searched linearly, larger ones through a hash index over the
// first entry of each name, seeded once per process so that crafted names cannot pile into one
// bucket. Names are shared strings, values shared references; nothing is copied on Add.
//
// Ownership: the dictionary holds one reference per stored value and one per name; everything it
// allocates for itself (entries, index, wrappers made by the typed Add overloads) comes from its
// own pool. Nested containers are released through the per-thread release queue (DictValue.h),
// so destroying a tree of any depth uses constant native stack.
//
// Readers: FromJson* read text that is wholly in memory with the hand-written reader (tolerant:
// bare keys and words, a comma before '}'; strict: duplicate keys, trailing data); escapes other
// than the one-letter ones stay as written. FromJsonBytesource reads a byte source through the
// streaming parser (JsonParser.h: strict JSON, escapes decoded, repeated keys kept). Both bound
// the nesting depth (JsonLimits, Limits.h); failures leave a message in `error` and return null.
//
// Thread safety: none; one thread at a time.
#pragma once

#include <cstddef>
#include <cstdint>

#include "sarn/dict/DictValue.h"

namespace sarn {

namespace internal {
class JsonReadSupport;
class TreeWalk;
}  // namespace internal
class TreeWriter;

class SARN_EXPORT Dictionary : public DictValue {
 public:
  Dictionary();
  ~Dictionary() override;

  // A new empty dictionary; a non-empty `typeName` is added as the quoted value of "type".
  // Null when memory runs out.
  static ref<Dictionary> New(VekMempool* pool, const VekString& typeName);

  // Adds `value` after the values already under `name` (the value is shared, not copied).
  // False, changing nothing, when the name already holds 65,535 values or memory runs out.
  bool Add(const VekString& name, const ref<DictValue>& value);
  bool Add(const VekString& name, const ref<ArrayValue>& value);
  bool Add(const VekString& name, const ref<NullValue>& value);
  bool Add(const VekString& name, const ref<StringValue>& value);
  bool Add(const VekString& name, const ref<Dictionary>& value);
  // Wrapping forms: a quoted StringValue, a LazyDictValue, the Base64 text of the bytes.
  bool Add(const VekString& name, const VekString& text);
  bool Add(const VekString& name, const ref<LazyDict>& payload);
  bool AddBytestring(const VekString& name, const ref<vek::ByteBuffer>& bytes);

  // The first value under `name`, or null.
  ref<DictValue> Get(const VekString& name) const;
  // Appends every value under `name`, in order, to `out` (not cleared first).
  void GetRange(const VekString& name, VekArray<DictValue>& out) const;
  // The text of the first value when it is a StringValue, else an empty string.
  VekString GetString(const VekString& name) const;
  // Appends the text of every StringValue under `name`, in order, skipping other kinds.
  void GetStringRange(const VekString& name, VekStringArray& out) const;
  // The first value under `name` when it has that kind, else null.
  ref<ArrayValue> GetArray(const VekString& name) const;
  ref<Dictionary> GetDictionary(const VekString& name) const;
  // Values under all names together (the number of names when each holds one value).
  unsigned CountNames() const { return nEntryM; }
  unsigned CountValues(const VekString& name) const;
  // Empties `out`, then fills it with every name once, in byte order. The platform array holds
  // at most 65,535 names; a larger dictionary still writes and compares all of its names.
  void GetSortedNames(VekStringArray& out) const;
  // Removes the name with all its values; false when it was absent.
  bool Remove(const VekString& name);

  // Same kind, same names, and under each name equal values in the same order.
  bool Equals(const ref<DictValue>& other) const override;
  bool Equals(const ref<Dictionary>& other) const;

  // Names in byte order, each written once per value.
  void ToJson(ByteBuffer& out, JsonFormat format) const override;
  void ToJson(wynbaselib::Bytesink& out, JsonFormat format) const override;
  VekString ToJson(bool pretty) const override;
  // The JSON text as a new byte string in the dictionary's pool; null when memory runs out.
  ref<vek::ByteBuffer> ToBytestring(bool pretty) const;
  void SetDebugLockOwner(VekLockId) {}

  // Reads a whole JSON document held in memory (DictionaryJsonReader.cpp). The top level must
  // be an object and nothing but whitespace may follow it. Null on failure with `error` set;
  // on success `error` is empty. Every node is made in `mempool`.
  static ref<Dictionary> FromJson(const unsigned char* data, size_t length, VekString& error, VekMempool* mempool);
  static ref<Dictionary> FromJson(const unsigned char* data, size_t length, VekString& error, VekMempool* mempool,
                                  const JsonLimits& limits);
  static ref<Dictionary> FromJson(const VekString& json, VekString& error, VekMempool* mempool);
  static ref<Dictionary> FromJson(const VekString& json, VekString& error, VekMempool* mempool,
                                  const JsonLimits& limits);
  static ref<Dictionary> FromJsonBytestring(const ref<vek::ByteBuffer>& bytes, VekString& error,
                                            VekMempool* mempool);
  static ref<Dictionary> FromJsonBytestring(const ref<vek::ByteBuffer>& bytes, VekString& error,
                                            VekMempool* mempool, const JsonLimits& limits);
  // Reads one object, from its '{' to its '}', into this dictionary.
  bool FromJson(InputPointer& input, VekString& error);
  bool FromJson(InputPointer& input, VekString& error, const JsonLimits& limits);
  // Reads one member value and adds it under `key`; a nested container counts from this
  // dictionary's level 1.
  bool ReadFieldValue(InputPointer& input, const VekString& key, VekString& error);
  bool ReadFieldValue(InputPointer& input, const VekString& key, VekString& error, const JsonLimits& limits);

  // Reads a whole JSON document from a byte source with the streaming parser (JsonParser.cpp),
  // 512 bytes at a time. Takes ownership of `source` and deletes it. On failure `error` holds
  // the message and the result is whatever had been built (null, or a partial object); on
  // success `error` is left as it was passed.
  static ref<Dictionary> FromJsonBytesource(wynbaselib::Bytesource* source, VekString& error, VekMempool* mempool);
  static ref<Dictionary> FromJsonBytesource(wynbaselib::Bytesource* source, VekString& error, VekMempool* mempool,
                                            const JsonLimits& limits);

 private:
  friend class internal::JsonReadSupport;
  friend class internal::TreeRelease;

  struct Entry {
    VekString nameM;
    DictValue* pValueM;  // one counted reference
    int32_t nextM;       // next entry with the same name, -1 at the end of the chain
    // For the first entry of a name: the index of the last entry of that name (>= 0). For a
    // later entry: minus its position in the chain (-1, -2, ...). So the count of a name is
    // known in O(1) and the first entries are told from the others by the sign.
    int32_t lastOrOrdinalM;
  };

  // With an index, FindFirst also gives the name's hash through `pHash` (kNoHash without one), so
  // that an append that follows does not hash the name again.
  static constexpr uint64_t kNoHash = ~uint64_t{0};
  int32_t FindFirst(const char* name, size_t nByte, uint64_t* pHash = nullptr) const;
  unsigned CountOf(int32_t first) const;
  // Append an entry, taking over one reference to `value` on success (on failure the caller
  // still owns it). AppendNewName is for a name known to be absent and takes over `name`.
  bool AppendNewName(VekString&& name, DictValue* value, uint64_t hash = kNoHash);
  bool AppendToName(int32_t first, DictValue* value);
  // Either of the two; takes over `name` when it becomes a new name's (untouched on failure).
  bool AppendAny(VekString&& name, DictValue* value);
  bool GrowEntries();
  bool RebuildIndex(uint32_t nSlot);
  void IndexInsert(int32_t entry, uint32_t hash);
  // The first entry of every name in byte order of the names, into `out` (nNameM slots). The
  // leading eight bytes of each name, read as a big-endian number, decide most comparisons
  // without touching the name again.
  struct SortKey {
    uint64_t prefixM;
    int32_t entryM;
  };
  // The first entries of the names in name order, into `out` (room for every name). `scratch`,
  // room for as many again or null, lets a large dictionary be sorted in linear time.
  void SortedFirsts(SortKey* out, SortKey* scratch) const;
  bool EqualsDictionary(const Dictionary& other) const;
  friend class internal::TreeWalk;
  friend class TreeWriter;

  Entry* vEntryM;
  uint32_t nEntryM;
  uint32_t capacityM;
  uint32_t nNameM;
  uint32_t indexMaskM;  // slots - 1, or 0 while there is no index
  // A slot keeps the name's hash beside its entry: probes compare hashes before they touch an
  // entry's name, and growing the index never hashes a name again.
  struct IndexSlot {
    uint32_t hashM;
    int32_t entryM;  // entry index + 1 of the first entry of a name; 0 marks an empty slot
  };
  IndexSlot* vIndexM;
  DictValue* pNextReleaseM;
};

}  // namespace sarn
