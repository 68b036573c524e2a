// Two string utilities: splitting at a separator and replacing a set of bytes. Positions and
// comparisons are by byte. Reentrant.
#pragma once

#include "sarn/base/Export.h"
#include "vek/VekString.h"

namespace sarn {

// Adds to `pieces` the parts of `text` between occurrences of `separator`, the last (possibly
// empty) part included: "a,b,,c" at "," adds "a", "b", "", "c". Returns false, adding nothing,
// when the separator does not occur, when it is empty (it would be found at every position
// without ever advancing), or when the pieces would not fit the array's 65,535 strings.
SARN_EXPORT bool SplitString(VekString text, const VekString& separator, VekStringArray& pieces);

// `text` up to its end or first NUL, with every byte that occurs in `chars` (up to its first
// NUL) replaced by `replacement`. The result is made in `pool`.
SARN_EXPORT VekString ReplaceCharsWithString(VekMempool* pool, const VekString& text, const VekString& chars,
                                             const VekString& replacement);

}  // namespace sarn
