#include "sarn/values/LongId.h"

#include <cstring>

#include "sarn/base/internal/NumberText.h"
#include "sarn/values/internal/LongIdText.h"

namespace sarn {

const LongIdPrefix longIdPrefixesG[nLongIdPrefixesG] = {
    {"rs", 1},     {"ts", 2},     {"bs", 3}, {"tms.ep", 5}, {"tms.sh", 6},
    {"tms.mv", 7}, {"tms.sp", 8}, {"vp", 9}, {"dlna", 10},  {"vod", 16384},
};

namespace internal {

const char* FindLongIdPrefix(unsigned int code) {
  for (const LongIdPrefix& row : longIdPrefixesG) {
    if (row.codeM == code) return row.pPrefixM;
  }
  return nullptr;
}

bool FindLongIdCode(const char* text, size_t length, unsigned int& code) {
  for (const LongIdPrefix& row : longIdPrefixesG) {
    if (std::strlen(row.pPrefixM) == length && std::memcmp(row.pPrefixM, text, length) == 0) {
      code = row.codeM;
      return true;
    }
  }
  return false;
}

size_t FormatLongIdInto(char* text, uint64_t id) {
  unsigned int code = static_cast<unsigned int>(id >> kLongIdShift);
  if (code == 0) return FormatU64Into(text, id);
  const char* prefix = FindLongIdPrefix(code);
  if (prefix == nullptr) prefix = "xxx";
  size_t n = std::strlen(prefix);
  std::memcpy(text, prefix, n);
  text[n++] = '.';
  return n + FormatU64Into(text + n, id & kLongIdNumberMask);
}

}  // namespace internal
}  // namespace sarn
