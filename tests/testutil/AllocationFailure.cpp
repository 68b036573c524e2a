#include "testutil/AllocationFailure.h"

#include <gtest/gtest.h>

#include <sstream>

namespace sarntest {

namespace {
// Far more allocations than any single operation makes: the countdown then never reaches zero,
// and what it lost is the number of allocations.
constexpr long kCountingBudget = 1L << 40;
}  // namespace

long SweepAllocationFailures(VekMempool* pool, const PoolOperation& operation, const std::string& failure) {
  auto noWindow = [] {};
  // A first run fills what lives on past an operation (the global name cache, caches kept by
  // the inputs), so that the counted run and the failing runs all start from the same state.
  Outcome good = operation(pool, noWindow);
  EXPECT_TRUE(good.isOkM) << "the operation fails with no failure injected: " << good.textM;
  size_t usedBefore = pool->GetUsedBytes();
  size_t liveBefore = pool->GetLiveBlocks();

  long nAllocation = -1;
  pool->FailAllocationAfter(kCountingBudget);
  Outcome counted = operation(pool, [&] {
    nAllocation = kCountingBudget - pool->GetFailCountdown();
    pool->FailAllocationAfter(-1);
  });
  EXPECT_EQ(counted.textM, good.textM) << "the operation is not repeatable";
  EXPECT_GT(nAllocation, 0) << "the operation allocates nothing in the pool (or never ends its run)";

  for (long i = 0; i < nAllocation; ++i) {
    bool wasInjected = false;
    pool->FailAllocationAfter(i);
    Outcome outcome = operation(pool, [&] {
      wasInjected = pool->GetFailCountdown() < 0;
      pool->FailAllocationAfter(-1);
    });
    std::ostringstream problems;
    if (!wasInjected) problems << " the run made fewer allocations than the good run;";
    if (outcome.isOkM && outcome.textM != good.textM) problems << " it succeeded with another result: " << outcome.textM;
    if (!outcome.isOkM && outcome.textM.compare(0, failure.size(), failure) != 0) {
      problems << " it failed with another report: " << outcome.textM;
    }
    if (pool->GetUsedBytes() != usedBefore || pool->GetLiveBlocks() != liveBefore) {
      problems << " the pool went from " << usedBefore << " bytes in " << liveBefore << " blocks to "
               << pool->GetUsedBytes() << " in " << pool->GetLiveBlocks() << ";";
    }
    if (!problems.str().empty()) {
      ADD_FAILURE() << "allocation " << i << " of " << nAllocation << " failed:" << problems.str();
      break;
    }
  }
  return nAllocation;
}

}  // namespace sarntest
