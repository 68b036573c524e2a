// Long identifiers: 64-bit ids whose top 16 bits name a namespace. Their text is the namespace's
// prefix, a '.', and the low 48 bits in decimal ("vod.17"); an id with top bits 0 is plain decimal.
#pragma once

#include "sarn/base/Export.h"

namespace sarn {

struct LongIdPrefix {
  const char* pPrefixM;
  unsigned int codeM;  // the top 16 bits of the identifier
};
// rs 1, ts 2, bs 3, tms.ep 5, tms.sh 6, tms.mv 7, tms.sp 8, vp 9, dlna 10, vod 16384; searched
// in this order.
constexpr int nLongIdPrefixesG = 10;
SARN_EXPORT extern const LongIdPrefix longIdPrefixesG[nLongIdPrefixesG];

}  // namespace sarn
