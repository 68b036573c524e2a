// EventLog: what an incremental reader reported through its callbacks, as a list of lines, so
// that feeding one input whole, byte by byte or split anywhere can be compared with one EXPECT.
// Pieces of one stream of data (a body, a long string) reported over several calls are joined
// into one line; the number of pieces is kept apart, as that is the one thing chunking changes.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace sarntest {

class EventLog {
 public:
  // One discrete event, e.g. "header Type=request".
  void Add(std::string event);
  // One piece of data: joined to the previous line when that is a piece of the same kind, so a
  // log reads "body {...}" however the data was split. An empty piece is counted apart.
  void AddPiece(std::string_view kind, std::string_view data);

  const std::vector<std::string>& Events() const { return eventsM; }
  size_t PieceCount() const { return pieceCountM; }
  size_t EmptyPieceCount() const { return emptyPieceCountM; }
  // The lines joined by newlines, for failure messages.
  std::string ToString() const;
  void Clear();

  bool operator==(const EventLog& other) const { return eventsM == other.eventsM; }
  bool operator!=(const EventLog& other) const { return !(*this == other); }

 private:
  std::vector<std::string> eventsM;
  std::string lastPieceKindM;  // kind of the piece that ends eventsM, or "" after Add
  size_t pieceCountM = 0;
  size_t emptyPieceCountM = 0;
};

}  // namespace sarntest
