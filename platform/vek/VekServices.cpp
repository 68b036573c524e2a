#include "vek/VekServices.h"

#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <mutex>

void VekAssertFail(const char* condition, const char* file) {
  std::fprintf(stderr, "VekAssertFail: %s (%s)\n", condition, file);
  std::abort();
}

namespace {
std::mutex& LoggerMutex() {
  static std::mutex* mutex = new std::mutex;
  return *mutex;
}
VekLogger::Sink gLoggerSinkG = nullptr;

std::atomic<uint64_t> vFeatureBitsG[VekFeatures::kMaxFeature / 64];
std::once_flag featureEnvOnceG;
}  // namespace

void VekLogger::Log(int facility, int priority, const char* tag, const char* format, ...) {
  char stackLine[512];
  va_list args;
  va_start(args, format);
  int n = std::vsnprintf(stackLine, sizeof stackLine, format, args);
  va_end(args);
  char* line = stackLine;
  char* heapLine = nullptr;
  if (n >= static_cast<int>(sizeof stackLine)) {
    heapLine = static_cast<char*>(std::malloc(static_cast<size_t>(n) + 1));
    if (heapLine != nullptr) {
      va_start(args, format);
      std::vsnprintf(heapLine, static_cast<size_t>(n) + 1, format, args);
      va_end(args);
      line = heapLine;
    }
  }
  {
    std::lock_guard<std::mutex> guard(LoggerMutex());
    if (gLoggerSinkG != nullptr) {
      gLoggerSinkG(facility, priority, tag != nullptr ? tag : "", line);
    } else {
      std::fprintf(stderr, "%s: %s\n", tag != nullptr ? tag : "", line);
    }
  }
  std::free(heapLine);
}

VekLogger::Sink VekLogger::SetSink(Sink sink) {
  std::lock_guard<std::mutex> guard(LoggerMutex());
  Sink old = gLoggerSinkG;
  gLoggerSinkG = sink;
  return old;
}

bool VekFeatures::FEnabled(int id) {
  std::call_once(featureEnvOnceG, [] {
    const char* value = std::getenv("VEK_FEATURE_548");
    if (value != nullptr && std::strcmp(value, "1") == 0) vFeatureBitsG[548 / 64].fetch_or(1ull << (548 % 64));
  });
  if (id < 0 || id >= kMaxFeature) return false;
  return (vFeatureBitsG[id / 64].load(std::memory_order_relaxed) >> (id % 64)) & 1;
}

void VekFeatures::SetEnabled(int id, bool isEnabled) {
  FEnabled(0);  // apply the environment first so a later query cannot undo this call
  if (id < 0 || id >= kMaxFeature) return;
  uint64_t bit = 1ull << (id % 64);
  if (isEnabled) {
    vFeatureBitsG[id / 64].fetch_or(bit);
  } else {
    vFeatureBitsG[id / 64].fetch_and(~bit);
  }
}

VekString VekTime::DebugStringAsInterval() const {
  int64_t ns = nanosecondsM;
  int64_t magnitude = ns < 0 ? -ns : ns;
  if (magnitude < 1000) return VekString::Format(nullptr, "%lldns", static_cast<long long>(ns));
  if (magnitude < 1000000) return VekString::Format(nullptr, "%.3fus", static_cast<double>(ns) / 1e3);
  if (magnitude < 1000000000) return VekString::Format(nullptr, "%.3fms", static_cast<double>(ns) / 1e6);
  return VekString::Format(nullptr, "%.6fs", static_cast<double>(ns) / 1e9);
}

VekTime VekMonotonicTime::Now() {
  struct timespec now;
  clock_gettime(CLOCK_MONOTONIC, &now);
  return VekTime(static_cast<int64_t>(now.tv_sec) * 1000000000 + now.tv_nsec);
}
