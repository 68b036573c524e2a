// Dictionary: the name table. Entries live in one array in insertion order, so that readers
// append without a per-entry allocation; a name's later values are chained from its first
// entry. Up to kLinearNames names a lookup is a linear scan (cheaper than hashing for the small
// objects that dominate real documents); beyond that an open-addressing index over first
// entries keeps lookups constant. The hash is seeded once per process: the names come from
// untrusted documents, and a fixed hash would let one document make every insert a full probe.
#include "sarn/dict/Dictionary.h"

#include <algorithm>
#include <chrono>
#include <cstring>
#include <new>

#include "sarn/values/ByteBuffer.h"
#include "sarn/dict/LazyDict.h"
#include "sarn/dict/internal/TreeWalk.h"

namespace sarn {

using internal::TreeRelease;
using internal::TreeWalk;

namespace {

constexpr uint32_t kLinearNames = 16;
constexpr uint32_t kFirstIndexSlots = 32;
constexpr uint32_t kRadixSortNames = 256;

uint64_t HashSeed() {
  static const uint64_t seed = [] {
    static int anchor;
    uint64_t s = reinterpret_cast<uintptr_t>(&anchor) ^
                 static_cast<uint64_t>(std::chrono::steady_clock::now().time_since_epoch().count());
    return s * 0x9E3779B97F4A7C15ull | 1;
  }();
  return seed;
}

inline uint64_t Mix(uint64_t h) {
  h ^= h >> 32;
  h *= 0xD6E8FEB86659FD93ull;
  h ^= h >> 32;
  return h;
}

uint32_t HashName(const char* data, size_t n) {
  uint64_t h = HashSeed() ^ (n * 0x9E3779B97F4A7C15ull);
  while (n >= 8) {
    uint64_t word;
    std::memcpy(&word, data, 8);
    h = Mix(h ^ word);
    data += 8;
    n -= 8;
  }
  uint64_t tail = 0;
  std::memcpy(&tail, data, n);
  return static_cast<uint32_t>(Mix(h ^ tail));
}

inline bool NameIs(const VekString& name, const char* data, size_t n) {
  return name.NByte() == n && std::memcmp(name.Utf8(), data, n) == 0;
}

}  // namespace

Dictionary::Dictionary()
    : DictValue(KIND_DICTIONARY),
      vEntryM(nullptr),
      nEntryM(0),
      capacityM(0),
      nNameM(0),
      indexMaskM(0),
      vIndexM(nullptr),
      pNextReleaseM(nullptr) {}

Dictionary::~Dictionary() {
  for (uint32_t i = 0; i < nEntryM; ++i) {
    TreeRelease::Release(vEntryM[i].pValueM);
    vEntryM[i].~Entry();
  }
  pMempoolM->Free(vEntryM);
  pMempoolM->Free(vIndexM);
}

ref<Dictionary> Dictionary::New(VekMempool* pool, const VekString& typeName) {
  ref<Dictionary> dictionary = new (pool) Dictionary();
  if (dictionary && !typeName.FEmpty() && !dictionary->Add(VekString("type"), typeName)) return ref<Dictionary>();
  return dictionary;
}

int32_t Dictionary::FindFirst(const char* name, size_t nByte, uint64_t* pHash) const {
  if (vIndexM == nullptr) {
    if (pHash != nullptr) *pHash = kNoHash;
    for (uint32_t i = 0; i < nEntryM; ++i) {
      if (NameIs(vEntryM[i].nameM, name, nByte)) return static_cast<int32_t>(i);
    }
    return -1;
  }
  uint32_t hash = HashName(name, nByte);
  if (pHash != nullptr) *pHash = hash;
  for (uint32_t slot = hash & indexMaskM;; slot = (slot + 1) & indexMaskM) {
    int32_t entry = vIndexM[slot].entryM - 1;
    if (entry < 0) return -1;
    if (vIndexM[slot].hashM == hash && NameIs(vEntryM[entry].nameM, name, nByte)) return entry;
  }
}

unsigned Dictionary::CountOf(int32_t first) const {
  int32_t last = vEntryM[first].lastOrOrdinalM;
  return last == first ? 1u : static_cast<unsigned>(-vEntryM[last].lastOrOrdinalM) + 1u;
}

bool Dictionary::GrowEntries() {
  if (nEntryM < capacityM) return true;
  if (capacityM >= 0x40000000u) return false;
  uint32_t capacity = capacityM == 0 ? 2 : capacityM < 8 ? capacityM * 2 : capacityM + capacityM / 2;
  Entry* entries = static_cast<Entry*>(pMempoolM->Malloc(sizeof(Entry) * capacity));
  if (entries == nullptr) return false;
  for (uint32_t i = 0; i < nEntryM; ++i) {
    new (&entries[i]) Entry{static_cast<VekString&&>(vEntryM[i].nameM), vEntryM[i].pValueM, vEntryM[i].nextM,
                            vEntryM[i].lastOrOrdinalM};
    vEntryM[i].~Entry();
  }
  pMempoolM->Free(vEntryM);
  vEntryM = entries;
  capacityM = capacity;
  return true;
}

void Dictionary::IndexInsert(int32_t entry, uint32_t hash) {
  uint32_t slot = hash & indexMaskM;
  while (vIndexM[slot].entryM != 0) slot = (slot + 1) & indexMaskM;
  vIndexM[slot] = IndexSlot{hash, entry + 1};
}

bool Dictionary::RebuildIndex(uint32_t nSlot) {
  IndexSlot* index = static_cast<IndexSlot*>(pMempoolM->Calloc(nSlot, sizeof(IndexSlot)));
  if (index == nullptr) return false;
  IndexSlot* old = vIndexM;
  uint32_t nOldSlot = old != nullptr ? indexMaskM + 1 : 0;
  vIndexM = index;
  indexMaskM = nSlot - 1;
  if (old != nullptr) {
    for (uint32_t i = 0; i < nOldSlot; ++i) {
      if (old[i].entryM != 0) IndexInsert(old[i].entryM - 1, old[i].hashM);
    }
    pMempoolM->Free(old);
    return true;
  }
  for (uint32_t i = 0; i < nEntryM; ++i) {
    const VekString& name = vEntryM[i].nameM;
    if (vEntryM[i].lastOrOrdinalM >= 0) IndexInsert(static_cast<int32_t>(i), HashName(name.Utf8(), name.NByte()));
  }
  return true;
}

bool Dictionary::AppendNewName(VekString&& name, DictValue* value, uint64_t hash) {
  if (!GrowEntries()) return false;
  // Keep the index at most half full; without one, build it once the scan gets long.
  if (vIndexM != nullptr ? (nNameM + 1) * 2 > indexMaskM + 1 : nNameM + 1 > kLinearNames) {
    uint32_t nSlot = vIndexM != nullptr ? (indexMaskM + 1) * 2 : kFirstIndexSlots;
    if (!RebuildIndex(nSlot)) return false;
  }
  int32_t entry = static_cast<int32_t>(nEntryM);
  new (&vEntryM[entry]) Entry{static_cast<VekString&&>(name), value, -1, entry};
  ++nEntryM;
  ++nNameM;
  if (vIndexM != nullptr) {
    const VekString& added = vEntryM[entry].nameM;
    IndexInsert(entry, hash != kNoHash ? static_cast<uint32_t>(hash) : HashName(added.Utf8(), added.NByte()));
  }
  return true;
}

bool Dictionary::AppendToName(int32_t first, DictValue* value) {
  unsigned count = CountOf(first);
  if (count >= kMaxValuesPerContainer || !GrowEntries()) return false;
  int32_t entry = static_cast<int32_t>(nEntryM);
  new (&vEntryM[entry]) Entry{vEntryM[first].nameM, value, -1, -static_cast<int32_t>(count)};
  ++nEntryM;
  vEntryM[vEntryM[first].lastOrOrdinalM].nextM = entry;
  vEntryM[first].lastOrOrdinalM = entry;
  return true;
}

bool Dictionary::AppendAny(VekString&& name, DictValue* value) {
  uint64_t hash;
  int32_t first = FindFirst(name.Utf8(), name.NByte(), &hash);
  if (first >= 0) return AppendToName(first, value);
  return AppendNewName(static_cast<VekString&&>(name), value, hash);
}

bool Dictionary::Add(const VekString& name, const ref<DictValue>& value) {
  if (!value) return false;
  value->UpRef();
  if (AppendAny(VekString(name), value.Get())) return true;
  value->DownRef();
  return false;
}

bool Dictionary::Add(const VekString& name, const ref<ArrayValue>& value) { return Add(name, ref<DictValue>(value)); }
bool Dictionary::Add(const VekString& name, const ref<NullValue>& value) { return Add(name, ref<DictValue>(value)); }
bool Dictionary::Add(const VekString& name, const ref<StringValue>& value) { return Add(name, ref<DictValue>(value)); }
bool Dictionary::Add(const VekString& name, const ref<Dictionary>& value) { return Add(name, ref<DictValue>(value)); }

bool Dictionary::Add(const VekString& name, const VekString& text) {
  return Add(name, ref<DictValue>(MempoolNew<StringValue>(pMempoolM, text)));
}

bool Dictionary::Add(const VekString& name, const ref<LazyDict>& payload) {
  return Add(name, ref<DictValue>(MempoolNew<LazyDictValue>(pMempoolM, payload)));
}

bool Dictionary::AddBytestring(const VekString& name, const ref<vek::ByteBuffer>& bytes) {
  return Add(name, ref<DictValue>(StringValue::Make(bytes, pMempoolM)));
}

ref<DictValue> Dictionary::Get(const VekString& name) const {
  int32_t first = FindFirst(name.Utf8(), name.NByte());
  return first < 0 ? ref<DictValue>() : ref<DictValue>(vEntryM[first].pValueM);
}

void Dictionary::GetRange(const VekString& name, VekArray<DictValue>& out) const {
  for (int32_t i = FindFirst(name.Utf8(), name.NByte()); i >= 0; i = vEntryM[i].nextM) out.Add(vEntryM[i].pValueM);
}

VekString Dictionary::GetString(const VekString& name) const {
  int32_t first = FindFirst(name.Utf8(), name.NByte());
  if (first < 0 || vEntryM[first].pValueM->kindM != KIND_STRING) return StringValue::EmptyValue(pMempoolM);
  return static_cast<const StringValue*>(vEntryM[first].pValueM)->valueM;
}

void Dictionary::GetStringRange(const VekString& name, VekStringArray& out) const {
  for (int32_t i = FindFirst(name.Utf8(), name.NByte()); i >= 0; i = vEntryM[i].nextM) {
    const DictValue* value = vEntryM[i].pValueM;
    if (value->kindM == KIND_STRING) out.Add(static_cast<const StringValue*>(value)->valueM);
  }
}

ref<ArrayValue> Dictionary::GetArray(const VekString& name) const {
  int32_t first = FindFirst(name.Utf8(), name.NByte());
  if (first < 0 || vEntryM[first].pValueM->kindM != KIND_ARRAY) return ref<ArrayValue>();
  return ref<ArrayValue>(static_cast<ArrayValue*>(vEntryM[first].pValueM));
}

ref<Dictionary> Dictionary::GetDictionary(const VekString& name) const {
  int32_t first = FindFirst(name.Utf8(), name.NByte());
  if (first < 0 || vEntryM[first].pValueM->kindM != KIND_DICTIONARY) return ref<Dictionary>();
  return ref<Dictionary>(static_cast<Dictionary*>(vEntryM[first].pValueM));
}

unsigned Dictionary::CountValues(const VekString& name) const {
  int32_t first = FindFirst(name.Utf8(), name.NByte());
  return first < 0 ? 0u : CountOf(first);
}

void Dictionary::GetSortedNames(VekStringArray& out) const {
  out.Clear();
  for (uint32_t i = 0; i < nEntryM; ++i) {
    if (vEntryM[i].lastOrOrdinalM >= 0) out.Add(vEntryM[i].nameM);
  }
  out.Sort();
}

void Dictionary::SortedFirsts(SortKey* out, SortKey* scratch) const {
  uint32_t n = 0;
  for (uint32_t i = 0; i < nEntryM; ++i) {
    if (vEntryM[i].lastOrOrdinalM < 0) continue;
    const VekString& name = vEntryM[i].nameM;
    unsigned char head[8] = {0, 0, 0, 0, 0, 0, 0, 0};
    std::memcpy(head, name.Utf8(), std::min<size_t>(name.NByte(), 8));
    uint64_t prefix = 0;
    for (unsigned char byte : head) prefix = prefix << 8 | byte;
    out[n++] = SortKey{prefix, static_cast<int32_t>(i)};
  }
  // Byte order, a shorter name before the longer one it starts (the order of GetSortedNames).
  // Equal prefixes (names that share eight bytes, or a short name against its NUL-extended
  // twin) fall back to the whole names.
  auto less = [this](const SortKey& a, const SortKey& b) {
    if (a.prefixM != b.prefixM) return a.prefixM < b.prefixM;
    const VekString& x = vEntryM[a.entryM].nameM;
    const VekString& y = vEntryM[b.entryM].nameM;
    size_t nx = x.NByte(), ny = y.NByte();
    int c = std::memcmp(x.Utf8(), y.Utf8(), std::min(nx, ny));
    return c != 0 ? c < 0 : nx < ny;
  };
  if (n <= 16) {
    for (uint32_t i = 1; i < n; ++i) {
      SortKey moving = out[i];
      uint32_t j = i;
      for (; j > 0 && less(moving, out[j - 1]); --j) out[j] = out[j - 1];
      out[j] = moving;
    }
    return;
  }
  if (scratch == nullptr || n < kRadixSortNames) {
    std::sort(out, out + n, less);
    return;
  }
  // Many names: a stable radix sort on the prefixes, a pass for each byte that differs at all,
  // then the runs of equal prefixes by their whole names. Comparison sorts fall to their slow
  // paths on the names of wide objects ("k1", "k10", "k100", ...) and compare far more often.
  uint32_t counts[8][256] = {};
  for (uint32_t i = 0; i < n; ++i) {
    for (int b = 0; b < 8; ++b) ++counts[b][(out[i].prefixM >> (8 * b)) & 0xFF];
  }
  SortKey* from = out;
  SortKey* to = scratch;
  for (int b = 0; b < 8; ++b) {
    uint32_t* count = counts[b];
    if (count[(from[0].prefixM >> (8 * b)) & 0xFF] == n) continue;  // the same byte in every prefix
    uint32_t at = 0;
    for (int v = 0; v < 256; ++v) {
      uint32_t c = count[v];
      count[v] = at;
      at += c;
    }
    for (uint32_t i = 0; i < n; ++i) to[count[(from[i].prefixM >> (8 * b)) & 0xFF]++] = from[i];
    std::swap(from, to);
  }
  if (from != out) std::memcpy(out, from, sizeof(SortKey) * n);
  for (uint32_t i = 0; i < n;) {
    uint32_t j = i + 1;
    while (j < n && out[j].prefixM == out[i].prefixM) ++j;
    if (j - i > 1) std::sort(out + i, out + j, less);
    i = j;
  }
}

bool Dictionary::Remove(const VekString& name) {
  if (FindFirst(name.Utf8(), name.NByte()) < 0) return false;
  // The survivors are moved down in place and linked again in their order, which allocates
  // nothing: removing a name can never cost another name its values, even without memory.
  uint32_t nOld = nEntryM;
  nEntryM = 0;
  nNameM = 0;
  if (vIndexM != nullptr) std::memset(vIndexM, 0, (indexMaskM + 1u) * sizeof(IndexSlot));
  for (uint32_t i = 0; i < nOld; ++i) {
    Entry& e = vEntryM[i];
    if (NameIs(e.nameM, name.Utf8(), name.NByte())) {
      TreeRelease::Release(e.pValueM);
      e.~Entry();
      continue;
    }
    int32_t entry = static_cast<int32_t>(nEntryM);
    if (static_cast<uint32_t>(entry) != i) {
      new (&vEntryM[entry]) Entry{e.nameM, e.pValueM, -1, entry};
      e.~Entry();
    }
    Entry& kept = vEntryM[entry];
    kept.nextM = -1;
    uint64_t hash;
    int32_t first = FindFirst(kept.nameM.Utf8(), kept.nameM.NByte(), &hash);  // among the entries kept so far
    ++nEntryM;
    if (first < 0) {
      kept.lastOrOrdinalM = entry;
      ++nNameM;
      if (vIndexM != nullptr) IndexInsert(entry, static_cast<uint32_t>(hash));
    } else {
      kept.lastOrOrdinalM = -static_cast<int32_t>(CountOf(first));
      vEntryM[vEntryM[first].lastOrOrdinalM].nextM = entry;
      vEntryM[first].lastOrOrdinalM = entry;
    }
  }
  return true;
}

bool Dictionary::Equals(const ref<DictValue>& other) const { return TreeWalk::Equal(*this, other.Get()); }

bool Dictionary::Equals(const ref<Dictionary>& other) const { return TreeWalk::Equal(*this, other.Get()); }

bool Dictionary::EqualsDictionary(const Dictionary& other) const {
  if (nNameM != other.nNameM) return false;
  for (uint32_t i = 0; i < nEntryM; ++i) {
    const Entry& e = vEntryM[i];
    if (e.lastOrOrdinalM < 0) continue;
    int32_t j = other.FindFirst(e.nameM.Utf8(), e.nameM.NByte());
    if (j < 0 || CountOf(static_cast<int32_t>(i)) != other.CountOf(j)) return false;
    for (int32_t a = static_cast<int32_t>(i); a >= 0; a = vEntryM[a].nextM, j = other.vEntryM[j].nextM) {
      if (!TreeWalk::Equal(*vEntryM[a].pValueM, other.vEntryM[j].pValueM)) return false;
    }
  }
  return true;
}

void Dictionary::ToJson(ByteBuffer& out, JsonFormat format) const { TreeWalk::Write(*this, out, format); }

void Dictionary::ToJson(wynbaselib::Bytesink& out, JsonFormat format) const { TreeWalk::Write(*this, out, format); }

VekString Dictionary::ToJson(bool pretty) const { return DictValue::ToJson(pretty); }

ref<vek::ByteBuffer> Dictionary::ToBytestring(bool pretty) const {
  ByteBuffer text(pMempoolM);
  TreeWalk::Write(*this, text, JsonFormat(pretty));
  if (text.HasFailed()) return ref<vek::ByteBuffer>();
  return vek::ByteBuffer::New(pMempoolM, text.GetData(), text.GetLength());
}

}  // namespace sarn
