// The one lookup of the long-identifier prefix table, and the one formatting of a long id, for
// the Dict text conventions, the object writers and the namespace helper alike.
#pragma once

#include <cstddef>
#include <cstdint>

#include "sarn/values/LongId.h"

namespace sarn {
namespace internal {

constexpr int kLongIdShift = 48;
constexpr uint64_t kLongIdNumberMask = (uint64_t{1} << kLongIdShift) - 1;
// Room for the longest text: a six-byte prefix, '.', and twenty digits.
constexpr size_t kLongIdTextRoom = 32;

// The prefix of a namespace code; null when no row has it.
const char* FindLongIdPrefix(unsigned int code);
// The code of the prefix text[0, length); false when no row has that prefix.
bool FindLongIdCode(const char* text, size_t length, unsigned int& code);
// Writes the id's text (no NUL) and returns its length; an unknown code gets the prefix "xxx".
size_t FormatLongIdInto(char* text, uint64_t id);

}  // namespace internal
}  // namespace sarn
