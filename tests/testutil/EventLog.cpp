#include "testutil/EventLog.h"

namespace sarntest {

void EventLog::Add(std::string event) {
  eventsM.push_back(std::move(event));
  lastPieceKindM.clear();
}

void EventLog::AddPiece(std::string_view kind, std::string_view data) {
  ++pieceCountM;
  if (data.empty()) ++emptyPieceCountM;
  if (!lastPieceKindM.empty() && lastPieceKindM == kind) {
    eventsM.back().append(data);
    return;
  }
  std::string line(kind);
  line += ' ';
  line.append(data);
  eventsM.push_back(std::move(line));
  lastPieceKindM = std::string(kind);
}

std::string EventLog::ToString() const {
  std::string text;
  for (const std::string& event : eventsM) {
    text += event;
    text += '\n';
  }
  return text;
}

void EventLog::Clear() {
  eventsM.clear();
  lastPieceKindM.clear();
  pieceCountM = 0;
  emptyPieceCountM = 0;
}

}  // namespace sarntest
