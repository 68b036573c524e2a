// The allocation-failure sweep: an operation is run once to count the pool allocations it makes,
// then once more per allocation with exactly that one failing. Each failing run must end cleanly:
// either the operation reports its failure or it recovers and gives the same result as the good
// run, and either way the pool is back where it was (used bytes and live blocks). So a failure
// path neither crashes, nor drops data silently, nor leaks.
#pragma once

#include <functional>
#include <string>

#include "vek/Vek.h"

namespace sarntest {

// What one run produced, as text the sweep can compare: the result (bytes, JSON) when the
// operation succeeded, the failure it reported (an error text, "null", "false") otherwise.
struct Outcome {
  bool isOkM;
  std::string textM;
};

// Runs the operation in `pool`. The operation calls `endOfRun` once its work is done and before
// it renders the outcome as text, so that rendering (which may allocate in the same pool) is
// neither counted nor failed. Everything the run made must be released before it returns.
using PoolOperation = std::function<Outcome(VekMempool* pool, const std::function<void()>& endOfRun)>;

// Sweeps `operation` in `pool` and reports each unclean run as a test failure (stopping at the
// first). Every failing run's report must start with `failure` (readers add where they were).
// Returns the number of allocations of the good run.
long SweepAllocationFailures(VekMempool* pool, const PoolOperation& operation, const std::string& failure);

}  // namespace sarntest
