// Dictionary values: the nodes of the schema-less tree (a text scalar, a null, an array, a lazy
// payload; the Dictionary container itself is in Dictionary.h) and JsonFormat, the state of the
// JSON writer.
//
// Ownership: every value is a VekCore made in a pool with the counted new and held through
// ref<T>. Containers hold one reference per stored value; values are shared, never copied, so
// one value may sit in several containers at once. Wrappers that a container makes for itself
// (a StringValue for a text, a LazyDictValue for a payload) come from the container's own pool.
// Releasing a tree never recurses once per level: containers hand their nested containers to a
// per-thread release queue, so a tree of any depth is destroyed in constant native stack.
//
// Thread safety: none. A tree is used by one thread at a time; reference counts are atomic, so
// values that nobody changes may be shared between trees used on different threads.
#pragma once

#include <cstdint>

#include "sarn/base/Export.h"
#include "sarn/base/Limits.h"
#include "vek/VekArray.h"
#include "vek/VekByteString.h"
#include "vek/VekCore.h"
#include "vek/VekString.h"
#include "wynbaselib/Bytestream.h"

namespace sarn {

class ByteBuffer;
class Dictionary;
class LazyDict;
struct InputPointer;
namespace internal {
class TreeRelease;
}  // namespace internal

// How a tree is written as JSON: compact or pretty, and the nesting depth reached so far. Each
// container increments the depth in its own copy before writing its children.
class SARN_EXPORT JsonFormat {
 public:
  explicit JsonFormat(bool pretty) : prettyM(pretty), depthM(0) {}
  // Pretty only: one line feed.
  void NewLine(ByteBuffer& out) const;
  void NewLine(wynbaselib::Bytesink& out) const;
  // Pretty only: four spaces per level of depthM.
  void Indent(ByteBuffer& out) const;
  void Indent(wynbaselib::Bytesink& out) const;

  bool prettyM;
  int32_t depthM;
};

class SARN_EXPORT DictValue : public VekCore {
 public:
  // Which concrete class a value is; most code dispatches on kindM rather than casting.
  enum Kind : uint32_t {
    KIND_STRING = 0,
    KIND_LAZY_DICT = 1,
    KIND_NULL = 2,
    KIND_ARRAY = 3,
    KIND_DICTIONARY = 4,
  };

  // Equality by the receiver's rule; values of different kinds are never equal.
  virtual bool Equals(const ref<DictValue>& other) const = 0;
  // Appends the JSON text of the value. Both forms write the same bytes. Out of memory, the
  // buffer is failed (ByteBuffer::HasFailed); a sink is told through the result of its Write.
  virtual void ToJson(ByteBuffer& out, JsonFormat format) const = 0;
  virtual void ToJson(wynbaselib::Bytesink& out, JsonFormat format) const = 0;
  // The JSON text of the value as a new string in the value's pool; empty when memory runs out.
  virtual VekString ToJson(bool pretty) const;

  const Kind kindM;

 protected:
  explicit DictValue(Kind kind) : kindM(kind) {}
};

// A scalar held as text: strings, numbers, booleans, Base64 byte strings, identifiers.
// needQuotesM only decides how the text is written: quoted, or bare when the text allows it.
//
// Layout: a value that a reader or Make(const char*) creates is one pool block, the value and
// right after it the representation of its text, which valueM references. The representation
// owns the block, and the value holds a second reference to it for as long as it lives, so the
// block is freed when the value and every copy of its text are gone, whichever goes last. A copy
// of valueM taken out of the tree therefore stays valid after the tree is released (the value's
// bytes stay with it); assigning a new text to valueM is allowed and changes no ownership. A value
// built with a constructor, or by the other Make functions, shares the text it was given instead.
class SARN_EXPORT StringValue : public DictValue {
 public:
  StringValue();
  explicit StringValue(const VekString& text);
  explicit StringValue(VekString&& text);

  void SetNeedQuotes(bool needQuotes) { needQuotesM = needQuotes; }
  VekString GetValue() const { return valueM; }
  // Typed readers: true on success, the out-parameter untouched on failure.
  bool GetValue(bool& out) const;                // exactly "true" or "false"
  bool GetValue(double& out) const;              // sscanf "%lg"
  bool GetValue(long long& out) const;           // sscanf "%lld"; trailing text ignored
  bool GetValue(int& out) const;                 // as long long, within the 32-bit range
  bool GetValue(unsigned long long& out) const;  // sscanf "%llu"
  bool GetValue(unsigned int& out) const;        // as unsigned long long, at most 4294967295
  // The Base64 decoding of the text (empty when it does not decode); false only when memory
  // runs out.
  bool GetValue(ref<vek::ByteBuffer>& out) const;

  // New values in `pool`. 64-bit integers and texts are quoted; bools, 32-bit integers and
  // floats are bare (a float with a '.' is still written quoted by the writer's bare-text rule).
  // Null when memory runs out (never a value with its text missing).
  static ref<StringValue> Make(const char* text, VekMempool* pool);
  static ref<StringValue> Make(const ref<vek::ByteBuffer>& bytes, VekMempool* pool);
  static ref<StringValue> Make(bool value, VekMempool* pool);
  static ref<StringValue> Make(double value, VekMempool* pool);
  static ref<StringValue> Make(int value, VekMempool* pool);
  static ref<StringValue> Make(unsigned int value, VekMempool* pool);
  static ref<StringValue> Make(long long value, VekMempool* pool);
  static ref<StringValue> Make(unsigned long long value, VekMempool* pool);
  static VekString EmptyValue(VekMempool* pool);

  bool Equals(const ref<DictValue>& other) const override;
  using DictValue::ToJson;
  void ToJson(ByteBuffer& out, JsonFormat format) const override;
  void ToJson(wynbaselib::Bytesink& out, JsonFormat format) const override;

  VekString valueM;
  bool needQuotesM;
};

// JSON null.
class SARN_EXPORT NullValue : public DictValue {
 public:
  NullValue() : DictValue(KIND_NULL) {}

  bool Equals(const ref<DictValue>& other) const override;
  using DictValue::ToJson;
  void ToJson(ByteBuffer& out, JsonFormat format) const override;
  void ToJson(wynbaselib::Bytesink& out, JsonFormat format) const override;
};

// An ordered list of values, at most 65,535 (the platform array's 16-bit count).
class SARN_EXPORT ArrayValue : public DictValue {
 public:
  ArrayValue();
  ~ArrayValue() override;

  // Appends the value itself (shared). False, changing nothing, when the array is full.
  bool Add(const ref<DictValue>& value);
  bool Add(const ref<ArrayValue>& value);
  bool Add(const ref<NullValue>& value);
  bool Add(const ref<StringValue>& value);
  bool Add(const ref<Dictionary>& value);
  // Appends a new quoted StringValue / LazyDictValue / Base64 StringValue made in the array's pool.
  bool Add(const VekString& text);
  bool Add(const ref<LazyDict>& payload);
  bool AddBytestring(const ref<vek::ByteBuffer>& bytes);

  // Null when `index` is not below the count.
  ref<DictValue> GetValueAt(unsigned long index) const;
  unsigned short CountValues() const { return valuesM.Count(); }
  // Removes by object: the first element that is the same object as element `index` (which is
  // element `index` itself unless that object also sits earlier). False when out of range.
  bool Remove(unsigned long index);

  // Reads one JSON array, from its '[' to its ']', appending its elements (DictionaryJsonReader).
  bool FromJson(InputPointer& input, VekString& error);
  bool FromJson(InputPointer& input, VekString& error, const JsonLimits& limits);
  // Reads one element and appends it; a nested container counts from this array's level 1.
  bool ReadFieldValue(InputPointer& input, VekString& error);
  bool ReadFieldValue(InputPointer& input, VekString& error, const JsonLimits& limits);

  bool Equals(const ref<DictValue>& other) const override;
  using DictValue::ToJson;
  void ToJson(ByteBuffer& out, JsonFormat format) const override;
  void ToJson(wynbaselib::Bytesink& out, JsonFormat format) const override;

  VekGenericArray valuesM;

 private:
  friend class internal::TreeRelease;
  DictValue* pNextReleaseM;  // link of the per-thread release queue
};

// A lazily converted payload inside a tree.
class SARN_EXPORT LazyDictValue : public DictValue {
 public:
  LazyDictValue();
  explicit LazyDictValue(const ref<LazyDict>& payload);
  ~LazyDictValue() override;

  ref<LazyDict> GetValue() const;
  // A payload holding the JSON text {}.
  static ref<LazyDict> EmptyValue(VekMempool* pool);

  // Equal to another LazyDictValue whose payload compares equal (two empty holders are equal).
  bool Equals(const ref<DictValue>& other) const override;
  // The payload's own JSON; its indentation restarts at depth 0 whatever the nesting. A holder
  // without a payload (default constructor) is written as null.
  using DictValue::ToJson;
  void ToJson(ByteBuffer& out, JsonFormat format) const override;
  void ToJson(wynbaselib::Bytesink& out, JsonFormat format) const override;

  ref<LazyDict> lazyDictM;
};

}  // namespace sarn
