// Scalar value types with a text form of their own: channel numbers, currency amounts, dates,
// times of day and date-times. Their Parse and ToString are the only text forms of these values
// in the library (JSON, dictionaries and the binary form all use them).
//
// Plain copyable value structs with public members. Parsing never reports an error: text that
// does not parse gives INVALID (channel numbers, currencies) or ZERO (the others), and ZERO is
// also a legitimate value. The constants are constant-initialised, so they hold their values
// even for other libraries' static initialisers. Every conversion is in UTC whatever the process time zone; all are
// reentrant. Strings returned come from the default pool.
#pragma once

#include <cstdint>

#include "sarn/base/Export.h"
#include "vek/VekString.h"

namespace sarn {

// A channel number with an optional sub-channel; -2 means "none" in either part.
struct SARN_EXPORT ChannelNumber {
  static const ChannelNumber INVALID;  // (-2, -2)

  constexpr ChannelNumber() : majorM(-2), minorM(-2) {}
  constexpr explicit ChannelNumber(int major) : majorM(major), minorM(-2) {}
  constexpr ChannelNumber(int major, int minor) : majorM(major), minorM(minor) {}

  // "5" or "5-1": a decimal major part (first character a digit), optionally '-' and a decimal
  // minor part, and nothing else. Each part is strtol's value cut to 32 bits.
  static ChannelNumber Parse(const VekString& text);
  // "invalid" for (-2, -2); "5" when only the minor part is -2; "5-1" otherwise ("-2-7").
  VekString ToString() const;
  bool operator==(const ChannelNumber& other) const { return majorM == other.majorM && minorM == other.minorM; }
  bool operator!=(const ChannelNumber& other) const { return !(*this == other); }

  int32_t majorM;
  int32_t minorM;
};

// An amount, a whole number in the units the peer sends, and a three-letter currency code.
struct SARN_EXPORT Currency {
  static const Currency INVALID;  // all 8 bytes 0

  // The same as Init(0, nullptr), usable in constant initialisation.
  constexpr Currency() : amountM(0), codeM{0, 0, 0, 0} {}
  Currency(int amount, const char* code) { Init(amount, code); }

  // All zero unless `code` has exactly 3 characters.
  void Init(int amount, const char* code);
  // "USD.1999": a three-character code, '.', then a decimal amount (first character a digit)
  // to the end of the text that fits 32 bits. Anything else is INVALID.
  static Currency Parse(const VekString& text);
  // "USD.1999" ("USD.-5" for a negative amount, which does not parse back); "invalid" when
  // there is no code.
  VekString ToString() const;
  // The 8 bytes are equal.
  bool operator==(const Currency& other) const;
  bool operator!=(const Currency& other) const { return !(*this == other); }

  int32_t amountM;
  char codeM[4];  // the code and its NUL
};

// Days since 1970-01-01, UTC.
struct SARN_EXPORT Date {
  static const Date ZERO;

  constexpr Date() : daysM(0) {}
  constexpr explicit Date(int32_t days) : daysM(days) {}
  // "2021-03-04" (strptime "%F" consuming the whole text); ZERO otherwise.
  static Date Parse(const VekString& text);
  // The same over the bytes [text, text + n), read up to the first NUL as the string form reads.
  static Date Parse(const char* text, size_t n);
  // "%F" of the day.
  VekString ToString() const;
  bool operator==(const Date& other) const { return daysM == other.daysM; }
  bool operator!=(const Date& other) const { return daysM != other.daysM; }

  int32_t daysM;
};

// Milliseconds since midnight.
struct SARN_EXPORT Time {
  static const Time ZERO;

  constexpr Time() : millisecondsM(0) {}
  constexpr explicit Time(int32_t milliseconds) : millisecondsM(milliseconds) {}
  // "13:05:09" (strptime "%T" consuming the whole text); ZERO otherwise.
  static Time Parse(const VekString& text);
  // The same over the bytes [text, text + n), read up to the first NUL as the string form reads.
  static Time Parse(const char* text, size_t n);
  // "%T"; milliseconds are dropped. Values outside one day have no defined text.
  VekString ToString() const;
  bool operator==(const Time& other) const { return millisecondsM == other.millisecondsM; }
  bool operator!=(const Time& other) const { return millisecondsM != other.millisecondsM; }

  int32_t millisecondsM;
};

// Milliseconds since 1970-01-01 00:00:00 UTC.
struct SARN_EXPORT DateTime {
  static const DateTime ZERO;

  constexpr DateTime() : millisecondsM(0) {}
  constexpr explicit DateTime(int64_t milliseconds) : millisecondsM(milliseconds) {}
  // "2021-03-04 13:05:09" or "2021-03-04T13:05:09"; ZERO otherwise.
  static DateTime Parse(const VekString& text);
  // The same over the bytes [text, text + n), read up to the first NUL as the string form reads.
  static DateTime Parse(const char* text, size_t n);
  // Always the space form; milliseconds are dropped.
  VekString ToString() const;
  // The wall clock, to the millisecond.
  static DateTime Now();
  bool operator==(const DateTime& other) const { return millisecondsM == other.millisecondsM; }
  bool operator!=(const DateTime& other) const { return millisecondsM != other.millisecondsM; }

  int64_t millisecondsM;
};

}  // namespace sarn
