// Allocation-failure injection for tests.
//
// Every test executable links this file. It replaces the global operator new
// family and wraps malloc/calloc/realloc (linker --wrap), and counts the
// allocations made while a FaultScope is armed. The library allocates only
// through non-throwing new and the malloc family, so failing "the Nth
// allocation" exercises every out-of-memory path of a call:
//
//   for (int n = 1;; ++n) {
//     lumicor::test::FaultScope fault(n);   // the nth allocation fails
//     uint32_t status = CallUnderTest(...);
//     if (!fault.Triggered()) { EXPECT_EQ(status, 0u); break; }
//     EXPECT_EQ(status, kOutOfMemory);      // and outputs as documented
//   }
//
// Throwing operator new never fails on purpose (the library does not use it
// on allocation paths that report codes; test code may use it freely).
#ifndef LUMICOR_TESTKIT_FAULT_H
#define LUMICOR_TESTKIT_FAULT_H

#include <cstddef>
#include <functional>

namespace lumicor {
namespace test {

class FaultScope {
public:
    // Arms the injector: the failAt-th counted allocation (1-based) fails.
    // failAt = 0 counts without failing.
    explicit FaultScope(long failAt);
    ~FaultScope();
    FaultScope(const FaultScope&) = delete;
    FaultScope& operator=(const FaultScope&) = delete;

    // True when the armed allocation was reached (and failed).
    bool Triggered() const;
    // Number of counted allocations so far in this scope.
    long Count() const;
};

// Runs `call` with the 1st, 2nd, ... allocation failing until a run completes
// without reaching the failing allocation. `check(n, triggered)` is called
// after every run so the test can assert on status and outputs. Returns the
// number of allocations of the successful run. Stops (returning -1) after
// `limit` runs.
long ForEachAllocationFailure(const std::function<void()>& call,
                              const std::function<void(long n, bool triggered)>& check,
                              long limit = 100000);

}  // namespace test
}  // namespace lumicor

#endif
