#include "sarn/values/StringUtil.h"

#include <cstring>

#include "sarn/values/ByteBuffer.h"

namespace sarn {

bool SplitString(VekString text, const VekString& separator, VekStringArray& pieces) {
  if (separator.FEmpty()) return false;
  long step = static_cast<long>(separator.NByte());
  // Count first, so that a text with too many pieces changes nothing.
  long count = 0;
  for (long at = text.FindString(separator); at >= 0; at = text.FindString(separator, at + step)) ++count;
  if (count == 0 || pieces.Count() + count + 1 > VekStringArray::kMaxCount) return false;
  long start = 0;
  for (long at = text.FindString(separator); at >= 0; at = text.FindString(separator, start)) {
    if (!pieces.Add(text.Middle(start, at))) return false;
    start = text.AdvancePos(at, step);
  }
  return pieces.Add(text.Right(start));
}

VekString ReplaceCharsWithString(VekMempool* pool, const VekString& text, const VekString& chars,
                                 const VekString& replacement) {
  bool isReplaced[256] = {};
  for (const unsigned char* c = reinterpret_cast<const unsigned char*>(chars.Utf8()); *c != '\0'; ++c) isReplaced[*c] = true;
  const unsigned char* p = reinterpret_cast<const unsigned char*>(text.Utf8());
  const unsigned char* end = p + std::strlen(text.Utf8());
  const unsigned char* with = reinterpret_cast<const unsigned char*>(replacement.Utf8());
  ByteBuffer out(pool);
  const unsigned char* run = p;
  for (; p != end; ++p) {
    if (!isReplaced[*p]) continue;
    out.AppendBytes(run, static_cast<unsigned long>(p - run));
    out.AppendBytes(with, replacement.NByte());
    run = p + 1;
  }
  out.AppendBytes(run, static_cast<unsigned long>(end - run));
  return VekString::FromUtf8Bytes(pool, out.GetLength(), out.GetData());
}

}  // namespace sarn
