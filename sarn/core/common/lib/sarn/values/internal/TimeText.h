// Dates and times as text without gmtime_r and strftime, giving the bytes of Date::ToString
// ("%F"), Time::ToString ("%T") and DateTime::ToString ("%F %T") where those are four-digit
// years; outside them the callers fall back to the scalar types' own ToString. Internal.
#pragma once

#include <cstddef>
#include <cstdint>

namespace sarn {
namespace internal {

// Years with exactly four digits in "%Y".
constexpr int64_t kFirstFastDay = -354285;   // 1000-01-01
constexpr int64_t kLastFastDay = 2932896;    // 9999-12-31

inline int64_t FloorDiv(int64_t a, int64_t b) { return a / b - ((a % b != 0) && ((a < 0) != (b < 0))); }

inline void TwoDigits(char* out, unsigned value) {
  out[0] = static_cast<char>('0' + value / 10);
  out[1] = static_cast<char>('0' + value % 10);
}

// "YYYY-MM-DD" of days since 1970-01-01 (10 bytes); false outside the four-digit years.
inline bool FormatDateText(int64_t days, char* out) {
  if (days < kFirstFastDay || days > kLastFastDay) return false;
  // Civil date from a day count (proleptic Gregorian), eras of 400 years starting in March.
  int64_t z = days + 719468;
  int64_t era = FloorDiv(z, 146097);
  unsigned doe = static_cast<unsigned>(z - era * 146097);
  unsigned yoe = (doe - doe / 1460 + doe / 36524 - doe / 146096) / 365;
  int64_t year = static_cast<int64_t>(yoe) + era * 400;
  unsigned doy = doe - (365 * yoe + yoe / 4 - yoe / 100);
  unsigned mp = (5 * doy + 2) / 153;
  unsigned day = doy - (153 * mp + 2) / 5 + 1;
  unsigned month = mp < 10 ? mp + 3 : mp - 9;
  if (month <= 2) ++year;
  TwoDigits(out, static_cast<unsigned>(year / 100));
  TwoDigits(out + 2, static_cast<unsigned>(year % 100));
  out[4] = '-';
  TwoDigits(out + 5, month);
  out[7] = '-';
  TwoDigits(out + 8, day);
  return true;
}

// "HH:MM:SS" of a second of the day (8 bytes).
inline void FormatTimeOfDayText(int64_t secondOfDay, char* out) {
  unsigned s = static_cast<unsigned>(secondOfDay);
  TwoDigits(out, s / 3600);
  out[2] = ':';
  TwoDigits(out + 3, s / 60 % 60);
  out[5] = ':';
  TwoDigits(out + 6, s % 60);
}

// The text of seconds since the epoch as "%F %T" (19 bytes); false outside the four-digit years.
inline bool FormatDateTimeText(int64_t seconds, char* out) {
  int64_t days = FloorDiv(seconds, 86400);
  if (!FormatDateText(days, out)) return false;
  out[10] = ' ';
  FormatTimeOfDayText(seconds - days * 86400, out + 11);
  return true;
}

}  // namespace internal
}  // namespace sarn
