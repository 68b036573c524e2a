// Text forms of the scalar value types. Dates and times go through the C library's UTC
// functions only (strptime, timegm, gmtime_r, strftime), none of which reads the process time
// zone for the "%F" and "%T" forms used here.
#include "sarn/values/ScalarTypes.h"

#include <sys/time.h>

#include <climits>
#include <cstdlib>
#include <cstring>
#include <ctime>

#include "sarn/base/internal/NumberText.h"

namespace sarn {

const ChannelNumber ChannelNumber::INVALID(-2, -2);
const Currency Currency::INVALID;
const Date Date::ZERO;
const Time Time::ZERO;
const DateTime DateTime::ZERO;

namespace {

constexpr long long kSecondsPerDay = 86400;

bool IsDigit(char c) { return c >= '0' && c <= '9'; }

// Scalar texts are C strings, here as in the Dict::Parse* family: a parser reads up to the first
// NUL, as the strtol and strptime forms it is built on do, and whatever follows a NUL is not seen.
const char* EndOf(const VekString& text) { return text.Utf8() + std::strlen(text.Utf8()); }

int32_t Cut32(long value) { return static_cast<int32_t>(static_cast<uint32_t>(static_cast<unsigned long>(value))); }

// strptime of the whole text; false when the format does not match or text is left over.
bool ParseWhole(const VekString& text, const char* format, struct tm& tm) {
  const char* end = strptime(text.Utf8(), format, &tm);
  return end != nullptr && end == EndOf(text);
}

// The canonical texts "YYYY-MM-DD" and "HH:MM:SS" are read by hand: for them strptime's "%F" and
// "%T" read each field's two or four digits whole (no field can stop early: months 01-12, days
// 01-31, hours 00-23, minutes and seconds 00-59), and timegm's value is the arithmetic below,
// a day past the month's end running into the next month as timegm normalises it. Any other
// text (spaces, single digits, leap seconds, NUL bytes, ...) goes to strptime itself.
bool Digits(const char* text, int count, int& value) {
  value = 0;
  for (int i = 0; i < count; ++i) {
    if (!IsDigit(text[i])) return false;
    value = value * 10 + (text[i] - '0');
  }
  return true;
}

bool CanonicalDate(const char* text, long long& days) {
  int year, month, day;
  if (!Digits(text, 4, year) || text[4] != '-' || !Digits(text + 5, 2, month) || text[7] != '-' ||
      !Digits(text + 8, 2, day) || month < 1 || month > 12 || day < 1 || day > 31) {
    return false;
  }
  // Days since 1970-01-01 of the proleptic Gregorian calendar, the year starting in March.
  long long y = year - (month <= 2 ? 1 : 0);
  long long era = y / 400;  // y >= -1: only year 0's January and February fall before era 0
  if (y < 0) era = -1;
  long long yearOfEra = y - era * 400;
  long long dayOfYear = (153 * (month > 2 ? month - 3 : month + 9) + 2) / 5 + day - 1;
  days = era * 146097 + yearOfEra * 365 + yearOfEra / 4 - yearOfEra / 100 + dayOfYear - 719468;
  return true;
}

bool CanonicalTime(const char* text, long long& seconds) {
  int hour, minute, second;
  if (!Digits(text, 2, hour) || text[2] != ':' || !Digits(text + 3, 2, minute) || text[5] != ':' ||
      !Digits(text + 6, 2, second) || hour > 23 || minute > 59 || second > 59) {
    return false;
  }
  seconds = hour * 3600LL + minute * 60 + second;
  return true;
}

// The text up to its first NUL, as the C functions see it, for strptime.
VekString CString(const char* text, size_t n) { return VekString::FromUtf8Bytes(nullptr, strnlen(text, n), text); }

VekString FormatUtc(long long seconds, const char* format) {
  time_t t = static_cast<time_t>(seconds);
  struct tm tm;
  if (gmtime_r(&t, &tm) == nullptr) return VekString();
  char text[50];
  size_t n = strftime(text, sizeof text, format, &tm);
  return VekString::FromUtf8Bytes(nullptr, n, text);
}

}  // namespace

ChannelNumber ChannelNumber::Parse(const VekString& text) {
  const char* p = text.Utf8();
  if (!IsDigit(*p)) return INVALID;
  char* end;
  long major = std::strtol(p, &end, 10);
  if (end == EndOf(text)) return ChannelNumber(Cut32(major), -2);
  if (*end != '-' || !IsDigit(end[1])) return INVALID;
  long minor = std::strtol(end + 1, &end, 10);
  if (end != EndOf(text)) return INVALID;
  return ChannelNumber(Cut32(major), Cut32(minor));
}

VekString ChannelNumber::ToString() const {
  if (majorM == -2 && minorM == -2) return VekString("invalid");
  char text[32];
  size_t n = internal::FormatS64Into(text, majorM);
  if (majorM == -2 || minorM != -2) {
    text[n++] = '-';
    n += internal::FormatS64Into(text + n, minorM);
  }
  return VekString::FromUtf8Bytes(nullptr, n, text);
}

void Currency::Init(int amount, const char* code) {
  if (code == nullptr || std::strlen(code) != 3) {
    amountM = 0;
    std::memset(codeM, 0, sizeof codeM);
    return;
  }
  amountM = amount;
  std::memcpy(codeM, code, sizeof codeM);
}

Currency Currency::Parse(const VekString& text) {
  const char* p = text.Utf8();
  if (std::strlen(p) < 5 || p[3] != '.' || !IsDigit(p[4])) return INVALID;
  char* end;
  long amount = std::strtol(p + 4, &end, 10);
  // An amount that does not fit the 32-bit member is refused rather than cut.
  if (end != EndOf(text) || amount > INT_MAX) return INVALID;
  char code[4] = {p[0], p[1], p[2], '\0'};
  return Currency(static_cast<int>(amount), code);
}

VekString Currency::ToString() const {
  if (codeM[0] == '\0') return VekString("invalid");
  // The code is read within its 4 bytes even if a caller filled all of them.
  const void* nul = std::memchr(codeM, '\0', sizeof codeM);
  size_t n = nul != nullptr ? static_cast<size_t>(static_cast<const char*>(nul) - codeM) : sizeof codeM;
  char text[32];
  std::memcpy(text, codeM, n);
  text[n++] = '.';
  n += internal::FormatS64Into(text + n, amountM);
  return VekString::FromUtf8Bytes(nullptr, n, text);
}

bool Currency::operator==(const Currency& other) const {
  return amountM == other.amountM && std::memcmp(codeM, other.codeM, sizeof codeM) == 0;
}

Date Date::Parse(const VekString& text) {
  long long days;
  if (text.NByte() == 10 && CanonicalDate(text.Utf8(), days)) return Date(static_cast<int32_t>(days));
  struct tm tm = {};
  if (!ParseWhole(text, "%F", tm)) return ZERO;
  return Date(static_cast<int32_t>(timegm(&tm) / kSecondsPerDay));
}

Date Date::Parse(const char* text, size_t n) {
  long long days;
  if (strnlen(text, n) == 10 && CanonicalDate(text, days)) return Date(static_cast<int32_t>(days));
  return Parse(CString(text, n));
}

VekString Date::ToString() const { return FormatUtc(daysM * kSecondsPerDay, "%F"); }

Time Time::Parse(const VekString& text) {
  long long seconds;
  if (text.NByte() == 8 && CanonicalTime(text.Utf8(), seconds)) return Time(static_cast<int32_t>(seconds * 1000));
  time_t epoch = 0;
  struct tm tm;
  gmtime_r(&epoch, &tm);
  if (!ParseWhole(text, "%T", tm)) return ZERO;
  return Time(static_cast<int32_t>(timegm(&tm) * 1000));
}

Time Time::Parse(const char* text, size_t n) {
  long long seconds;
  if (strnlen(text, n) == 8 && CanonicalTime(text, seconds)) return Time(static_cast<int32_t>(seconds * 1000));
  return Parse(CString(text, n));
}

VekString Time::ToString() const { return FormatUtc(millisecondsM / 1000, "%T"); }

// "YYYY-MM-DD HH:MM:SS" or with 'T' between: the space of the first format matches the space
// (and, matching no space at all, fails on the 'T', which the second format then matches).
static bool CanonicalDateTime(const char* text, size_t n, DateTime& value) {
  long long days, seconds;
  if (n != 19 || (text[10] != ' ' && text[10] != 'T') || !CanonicalDate(text, days) ||
      !CanonicalTime(text + 11, seconds)) {
    return false;
  }
  value = DateTime((days * kSecondsPerDay + seconds) * 1000);
  return true;
}

DateTime DateTime::Parse(const VekString& text) {
  DateTime value;
  if (CanonicalDateTime(text.Utf8(), text.NByte(), value)) return value;
  struct tm tm = {};
  if (!ParseWhole(text, "%F %T", tm)) {
    tm = {};
    if (!ParseWhole(text, "%FT%T", tm)) return ZERO;
  }
  return DateTime(static_cast<int64_t>(timegm(&tm)) * 1000);
}

DateTime DateTime::Parse(const char* text, size_t n) {
  DateTime value;
  if (CanonicalDateTime(text, strnlen(text, n), value)) return value;
  return Parse(CString(text, n));
}

VekString DateTime::ToString() const { return FormatUtc(millisecondsM / 1000, "%F %T"); }

DateTime DateTime::Now() {
  struct timeval now;
  gettimeofday(&now, nullptr);
  return DateTime(static_cast<int64_t>(now.tv_sec) * 1000 + now.tv_usec / 1000);
}

}  // namespace sarn
