// Dict: the reference-counted facade over a Dictionary, and the scalar text conventions of the
// whole library (booleans, integers, floats, long identifiers, byte strings).
//
// Scalar text conversions (the static Parse* and Format* members) need no dictionary: they are
// functions of their arguments and of the constant long-identifier prefix table. Only the
// byte-string conversions use their pool; the other results are plain strings. No parser
// reports failure separately: malformed text gives 0 (0.0, false), like a parsed zero. All of
// them are reentrant.
//
// A long identifier is a 64-bit number whose top 16 bits hold a prefix code (0 for none) and
// whose low 48 bits hold the number; its text is "prefix.number" ("tms.ep.12") or the plain
// number.
#pragma once

#include "sarn/dict/Dictionary.h"
#include "sarn/values/LongId.h"
#include "sarn/base/Export.h"
#include "vek/VekByteString.h"
#include "vek/VekCore.h"
#include "vek/VekString.h"

namespace sarn {

class LazyDict;

// What Dict::GetType finds under a name and index.
namespace dictvalue {
enum Type {
  TYPE_STRING = 0,  // a StringValue
  TYPE_DICT = 1,    // a Dictionary or a LazyDictValue (GetType's flag tells which)
  TYPE_NONE = 2,    // nothing there, or a NullValue or an ArrayValue
};
}  // namespace dictvalue

class SARN_EXPORT Dict : public VekCore {
 public:
  // ---- Scalar text conversions -------------------------------------------------------------
  static VekString FormatBool(VekMempool* pool, bool value);  // "true" or "false"
  static VekString FormatS32(VekMempool* pool, int value);
  static VekString FormatS64(VekMempool* pool, long long value);
  static VekString FormatU32(VekMempool* pool, unsigned int value);
  static VekString FormatU64(VekMempool* pool, unsigned long long value);
  // "%1.8g", with ".0" appended when that holds no '.': 1.0, 0.1, 1.2345679e+08, 1e+20.0.
  static VekString FormatFloat(VekMempool* pool, double value);
  // "prefix.number" for a known prefix code, "xxx.number" for an unknown one, the plain number
  // when the top 16 bits are 0.
  static VekString FormatLongId(VekMempool* pool, unsigned long long id);
  // The Base64 text of the bytes.
  static VekString FormatBytestring(VekMempool* pool, const ref<vek::ByteBuffer>& bytes);

  // True only for the exact text "true".
  static bool ParseBool(VekMempool* pool, const VekString& text);
  // '-' or a digit first, then base-10 digits to the end of the text; saturates at the 64-bit
  // limits. ParseS32 keeps the low 32 bits of that, without a range check.
  static int ParseS32(VekMempool* pool, const VekString& text);
  static long long ParseS64(VekMempool* pool, const VekString& text);
  // One or more ASCII digits and nothing else (null is 0); wraps modulo 2^64 on overflow.
  static unsigned long long ParseU64(VekMempool* pool, const char* text);
  // ParseU64, then 0 when the value does not fit 32 bits.
  static unsigned int ParseU32(VekMempool* pool, const char* text);
  // sscanf "%lg"; 0.0 when nothing converts.
  static double ParseFloat(VekMempool* pool, const VekString& text);
  // The inverse of FormatLongId: the prefix before the last '.' must be a known one (else 0);
  // the number after it is ParseU64 of the rest.
  static unsigned long long ParseLongId(VekMempool* pool, const char* text);
  // The bytes of Base64 text; never null, empty when the text does not decode.
  static ref<vek::ByteBuffer> ParseBytestring(VekMempool* pool, const VekString& text);

  // ---- Facade over a Dictionary (Dict.cpp) --------------------------------------------------
  // Under the facade every name holds one value; a second value added under a name turns the
  // entry into an ArrayValue holding all of them, and indexes address that array's elements
  // (index 0 is the value itself when it is not an array). Only the first value stored under a
  // name is seen, so a Dictionary with repeated names (from the streaming parser) shows only
  // the first of them. Nested dictionaries are shared, never copied. Absent names and wrong
  // kinds give empty answers; only GetLazyDict reports anything, on standard error.

  // A new empty Dictionary in the Dict's own pool.
  Dict();
  explicit Dict(const ref<Dictionary>& dictionary);
  ~Dict() override;
  Dict(const Dict&) = delete;
  Dict& operator=(const Dict&) = delete;
  // MakeDict, then "type" = typeName when it is not empty. Null when memory runs out.
  static ref<Dict> New(VekMempool* pool, const VekString& typeName);
  ref<Dictionary> GetDictionary() const { return dictionaryM; }

  // The adds return false, changing nothing, when memory runs out (or an array is full).
  bool AddString(const VekString& name, const VekString& value);
  bool AddString(const char* name, const char* value);
  // Adds the Dict's Dictionary (shared); nothing (and true) when `value` is null.
  bool AddDict(const VekString& name, const ref<Dict>& value);
  bool AddDict(const char* name, const ref<Dict>& value);
  // Adds a LazyDictValue around the payload; nothing (and true) when `value` is null.
  bool AddLazyDict(const VekString& name, const ref<LazyDict>& value);
  bool AddLazyDict(const char* name, const ref<LazyDict>& value);
  void InsertTypeZero(const VekString& typeName);
  // Adds `value`, or appends it to the array under `name` (which it creates from the value
  // already there). Instantiated for VekString, ref<Dictionary> and ref<LazyDict>.
  template <class T>
  bool AddToDictOrArray(const VekString& name, const T& value);

  // A negative index arrives as a huge unsigned one and finds nothing.
  ref<DictValue> FindValue(const VekString& name, unsigned long index) const;
  dictvalue::Type GetType(const VekString& name, int index, bool& isLazy) const;
  dictvalue::Type GetType(const VekString& name, int index) const;
  dictvalue::Type GetType(const char* name, int index) const;
  // The text of a StringValue, else an empty string.
  VekString GetString(const VekString& name, int index) const;
  VekString GetString(const char* name, int index) const;
  // A Dict sharing a nested Dictionary, a payload's ToDict(), else a new empty Dict.
  ref<Dict> GetDict(const VekString& name, int index) const;
  ref<Dict> GetDict(const char* name, int index) const;
  // A payload (shared), a new payload around a nested Dictionary, else (with a message on
  // standard error) a payload holding {}.
  ref<LazyDict> GetLazyDict(const VekString& name, int index) const;
  ref<LazyDict> GetLazyDict(const char* name, int index) const;
  unsigned CountNames() const;
  // 0 when absent, the array's count for an array, else 1.
  unsigned CountValues(const VekString& name) const;
  unsigned CountValues(const char* name) const;
  void GetSortedNames(VekStringArray& out) const;

  // All values of the name.
  void Remove(const VekString& name);
  void Remove(const char* name);
  // One element of an array (the name goes when the array empties); a single value's whole name
  // whatever the index.
  void Remove(const VekString& name, int index);
  void Remove(const char* name, int index);

  // Dictionary equality of the two trees.
  bool Equals(const Dict* other) const;
  // The facade's comparison: names, counts, and value by value through the typed readers; a
  // null or an array anywhere makes two Dicts unequal, and payloads are equal only when they
  // are the same object.
  bool Equals(const ref<Dict>& other) const;
  // Equal compact JSON texts.
  bool operator==(const Dict& other) const;
  VekString ToString(bool pretty) const;
  ref<vek::ByteBuffer> ToBytestring(bool pretty) const;
  void SetDebugLockOwner(VekLockId id);

  ref<Dictionary> dictionaryM;
};

// A new empty Dict in `pool`; null when memory runs out.
SARN_EXPORT ref<Dict> MakeDict(VekMempool* pool);

}  // namespace sarn
