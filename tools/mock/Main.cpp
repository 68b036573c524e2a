// sarn-mock: options, the canned table, and the listening socket (127.0.0.1 only).
#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <thread>

#include "Mock.h"

namespace {

const char kHelp[] =
    "Usage: sarn-mock --responses DIR [--port N] [--stdio] [--log FILE] [--timestamps]\n"
    "                 [--exit-after N] [--timeout S]\n"
    "Answers MRPC/2 requests with canned bodies, on 127.0.0.1 only, for trying clients.\n"
    "\n"
    "  --responses DIR  the bodies by request type T: DIR/T.json, or DIR/T.1.json, DIR/T.2.json...\n"
    "                   A \"single\" request gets the first, a \"multiple\" one all of them (the\n"
    "                   last final), a \"none\" one nothing; a type without bodies gets one final\n"
    "                   error body. Every file is checked at start.\n"
    "  --port N         the port to listen on (default 0: any free one); the first line on\n"
    "                   standard output is \"sarn-mock: listening on 127.0.0.1:PORT\"\n"
    "  --stdio          serve one session on standard input and output instead\n"
    "  --log FILE       the event log (default: standard error): one line per event, the\n"
    "                   connection number, then open, close, in or out with the message, or\n"
    "                   error with its text\n"
    "  --timestamps     start each log line with the UTC time\n"
    "  --exit-after N   exit once N connections have closed\n"
    "  --timeout S      close a connection idle for S seconds (default 30)\n"
    "\n"
    "At most 16 connections are served at once; more are refused. Status 2 for a usage error or\n"
    "a bad canned file.\n";

int Usage(const std::string& message) {
  std::fprintf(stderr, "sarn-mock: %s\nTry 'sarn-mock --help'.\n", message.c_str());
  return 2;
}

bool Number(const char* text, long low, long high, long& out) {
  char* end = nullptr;
  out = std::strtol(text, &end, 10);
  return *text >= '0' && *text <= '9' && *end == '\0' && out >= low && out <= high;
}

}  // namespace

int main(int argc, char** argv) {
  std::signal(SIGPIPE, SIG_IGN);
  static sarnmock::Settings settings;
  std::string responses, logPath;
  long port = 0, exitAfter = 0;
  bool isStdio = false, isTimestamps = false;
  for (int i = 1; i < argc; ++i) {
    std::string option = argv[i];
    auto value = [&](long low, long high, long& out) {
      return i + 1 < argc && Number(argv[++i], low, high, out);
    };
    long timeout;
    if (option == "--help") {
      std::fputs(kHelp, stdout);
      return 0;
    } else if (option == "--responses" && i + 1 < argc) {
      responses = argv[++i];
    } else if (option == "--log" && i + 1 < argc) {
      logPath = argv[++i];
    } else if (option == "--stdio") {
      isStdio = true;
    } else if (option == "--timestamps") {
      isTimestamps = true;
    } else if (option == "--port") {
      if (!value(0, 65535, port)) return Usage("--port takes a number from 0 to 65535");
    } else if (option == "--exit-after") {
      if (!value(1, 1000000, exitAfter)) return Usage("--exit-after takes a number from 1 to 1000000");
    } else if (option == "--timeout") {
      if (!value(1, 86400, timeout)) return Usage("--timeout takes a number of seconds from 1 to 86400");
      settings.idleTimeoutSeconds = static_cast<int>(timeout);
    } else {
      return Usage("unknown option or missing value '" + option + "'");
    }
  }
  if (responses.empty()) return Usage("--responses DIR is required");
  std::string error;
  if (!settings.table.Load(responses, error)) return std::fprintf(stderr, "sarn-mock: %s\n", error.c_str()), 2;
  if (!settings.log.Open(logPath, isTimestamps)) {
    return std::fprintf(stderr, "sarn-mock: %s: %s\n", logPath.c_str(), std::strerror(errno)), 2;
  }
  if (isStdio) {
    sarnmock::Serve(settings, 1, 0, 1);
    return 0;
  }

  int listener = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
  int on = 1;
  setsockopt(listener, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
  sockaddr_in address = {};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  address.sin_port = htons(static_cast<uint16_t>(port));
  socklen_t size = sizeof address;
  if (listener < 0 || bind(listener, reinterpret_cast<sockaddr*>(&address), sizeof address) != 0 ||
      listen(listener, 64) != 0 || getsockname(listener, reinterpret_cast<sockaddr*>(&address), &size) != 0) {
    return std::fprintf(stderr, "sarn-mock: 127.0.0.1:%ld: %s\n", port, std::strerror(errno)), 2;
  }
  std::printf("sarn-mock: listening on 127.0.0.1:%d\n", ntohs(address.sin_port));
  std::fflush(stdout);

  static std::atomic<int> active(0), closed(0);
  unsigned connections = 0;
  while (exitAfter == 0 || closed.load() < exitAfter) {
    pollfd wait = {listener, POLLIN, 0};
    if (poll(&wait, 1, 100) <= 0) continue;
    int fd = accept4(listener, nullptr, nullptr, SOCK_CLOEXEC);
    if (fd < 0) continue;
    unsigned connection = ++connections;
    if (active.load() >= sarnmock::kMaxConnections) {
      settings.log.Line(connection, "error", "too many connections (16 at once): refused");
      close(fd);
      continue;
    }
    ++active;
    std::thread([fd, connection] {
      sarnmock::Serve(settings, connection, fd, fd);
      close(fd);
      --active;
      ++closed;
    }).detach();
  }
  close(listener);
  return 0;
}
