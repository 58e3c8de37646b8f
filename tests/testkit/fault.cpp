#include "testkit/fault.h"

#include <atomic>
#include <cstdlib>
#include <new>

extern "C" {
void* __real_malloc(size_t size);
void* __real_calloc(size_t n, size_t size);
void* __real_realloc(void* p, size_t size);
}

namespace {

// One armed scope at a time; the counters are thread-local so that helper
// threads of the test runner are not counted.
thread_local bool t_armed = false;
thread_local long t_failAt = 0;
thread_local long t_count = 0;
thread_local bool t_triggered = false;

bool ShouldFail() {
    if (!t_armed) return false;
    ++t_count;
    if (t_failAt != 0 && t_count == t_failAt) {
        t_triggered = true;
        return true;
    }
    return false;
}

}  // namespace

extern "C" {
void* __wrap_malloc(size_t size) { return ShouldFail() ? nullptr : __real_malloc(size); }
void* __wrap_calloc(size_t n, size_t size) { return ShouldFail() ? nullptr : __real_calloc(n, size); }
void* __wrap_realloc(void* p, size_t size) { return ShouldFail() ? nullptr : __real_realloc(p, size); }
}

// Replacement operator new family. All forms allocate with the real malloc so
// that sanitizers see one consistent allocator; only the non-throwing forms
// take part in failure injection.
void* operator new(std::size_t size) {
    void* p = __real_malloc(size ? size : 1);
    if (!p) throw std::bad_alloc();
    return p;
}
void* operator new[](std::size_t size) { return operator new(size); }
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    if (ShouldFail()) return nullptr;
    return __real_malloc(size ? size : 1);
}
void* operator new[](std::size_t size, const std::nothrow_t& tag) noexcept { return operator new(size, tag); }
void operator delete(void* p) noexcept { std::free(p); }
void operator delete[](void* p) noexcept { std::free(p); }
void operator delete(void* p, std::size_t) noexcept { std::free(p); }
void operator delete[](void* p, std::size_t) noexcept { std::free(p); }
void operator delete(void* p, const std::nothrow_t&) noexcept { std::free(p); }
void operator delete[](void* p, const std::nothrow_t&) noexcept { std::free(p); }

namespace lumicor {
namespace test {

FaultScope::FaultScope(long failAt) {
    t_count = 0;
    t_triggered = false;
    t_failAt = failAt;
    t_armed = true;
}

FaultScope::~FaultScope() { t_armed = false; }

bool FaultScope::Triggered() const { return t_triggered; }
long FaultScope::Count() const { return t_count; }

long ForEachAllocationFailure(const std::function<void()>& call,
                              const std::function<void(long, bool)>& check, long limit) {
    for (long n = 1; n <= limit; ++n) {
        bool triggered;
        long count;
        {
            FaultScope scope(n);
            call();
            triggered = scope.Triggered();
            count = scope.Count();
        }
        check(n, triggered);
        if (!triggered) return count;
    }
    return -1;
}

}  // namespace test
}  // namespace lumicor
