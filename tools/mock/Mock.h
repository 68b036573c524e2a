// sarn-mock: a loopback stand-in for the service, for trying clients without one. It answers each
// request with canned bodies read from a folder at start, by the request's type, and logs every
// event. It is the project's only networking code: the library, the tool and the examples never
// open a socket.
//
// Threads: one per connection, each with a pool of its own; the canned table is built before the
// first connection and only read afterwards; the log is shared under a lock.
#pragma once

#include <atomic>
#include <cstdio>
#include <map>
#include <mutex>
#include <string>
#include <vector>

#include "sarn/Sarn.h"

namespace sarnmock {

// The canned bodies by request type: DIR/T.json, or DIR/T.1.json, DIR/T.2.json, ... in order.
class CannedTable {
 public:
  // Reads and checks every *.json file of `dir` (JSON, a known type, converting at version 0);
  // false with "FILE: message" in `error` for the first bad one.
  bool Load(const std::string& dir, std::string& error);
  // The bodies for `requestType`, or null when there are none. The type is only ever a key
  // into this table, never part of a path.
  const std::vector<std::string>* Find(const std::string& requestType) const;

 private:
  std::map<std::string, std::map<unsigned, std::string>> bodiesByNumberM;
  std::map<std::string, std::vector<std::string>> bodiesM;
};

// One line per event: "[TIME ]N EVENT[ TEXT]".
class Log {
 public:
  Log() : pFileM(stderr), isTimestampsM(false) {}
  ~Log();
  bool Open(const std::string& path, bool isTimestamps);
  void Line(unsigned connection, const char* event, const std::string& text = "");

 private:
  std::mutex lockM;
  FILE* pFileM;
  bool isTimestampsM;
};

struct Settings {
  CannedTable table;
  Log log;
  int idleTimeoutSeconds = 30;
};

// Serves one connection (or the --stdio session) until the peer closes it, sends a frame that
// is refused, or stays idle past the timeout.
void Serve(Settings& settings, unsigned connection, int inFd, int outFd);

// Connections served at once; one more is refused.
constexpr int kMaxConnections = 16;

}  // namespace sarnmock
