// Ownership helpers for the library's internals. Allocation never throws:
// NewArray returns an empty pointer on failure and the caller reports its
// out-of-memory code. Owners release on every path by construction.
#ifndef LUMICOR_COMMON_INTERNAL_MEMORY_H
#define LUMICOR_COMMON_INTERNAL_MEMORY_H

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <new>
#include <utility>

namespace lmk {

template <typename T>
using UniqueArray = std::unique_ptr<T[]>;

// Value-initialised (zeroed for plain records) array of n elements, or empty
// on failure or when n is 0.
template <typename T>
UniqueArray<T> NewArray(size_t n) {
    if (n == 0) return UniqueArray<T>();
    return UniqueArray<T>(new (std::nothrow) T[n]());
}

// The same without the zeroing, for large buffers that are written in full
// before they are read.
template <typename T>
UniqueArray<T> NewUninitializedArray(size_t n) {
    if (n == 0) return UniqueArray<T>();
    return UniqueArray<T>(new (std::nothrow) T[n]);
}

template <typename T, typename... Args>
std::unique_ptr<T> NewObject(Args&&... args) {
    return std::unique_ptr<T>(new (std::nothrow) T(std::forward<Args>(args)...));
}

struct FreeDeleter {
    void operator()(void* p) const { std::free(p); }
};
template <typename T>
using MallocPtr = std::unique_ptr<T, FreeDeleter>;

// Runs a callable when the scope ends unless dismissed.
template <typename F>
class ScopeGuard {
public:
    explicit ScopeGuard(F f) : f_(std::move(f)), active_(true) {}
    ScopeGuard(ScopeGuard&& o) noexcept : f_(std::move(o.f_)), active_(o.active_) { o.active_ = false; }
    ~ScopeGuard() {
        if (active_) f_();
    }
    void Dismiss() { active_ = false; }
    ScopeGuard(const ScopeGuard&) = delete;
    ScopeGuard& operator=(const ScopeGuard&) = delete;

private:
    F f_;
    bool active_;
};
template <typename F>
ScopeGuard<F> MakeScopeGuard(F f) {
    return ScopeGuard<F>(std::move(f));
}

// Checked size arithmetic in 32-bit terms (size_t is 32 bits on the target).
// Return false on overflow and leave *out untouched.
inline bool CheckedMul(uint32_t a, uint32_t b, uint32_t* out) {
    const uint64_t r = static_cast<uint64_t>(a) * b;
    if (r > UINT32_MAX) return false;
    *out = static_cast<uint32_t>(r);
    return true;
}
inline bool CheckedMul(uint32_t a, uint32_t b, uint32_t c, uint32_t* out) {
    uint32_t ab;
    return CheckedMul(a, b, &ab) && CheckedMul(ab, c, out);
}
inline bool CheckedAdd(uint32_t a, uint32_t b, uint32_t* out) {
    if (a > UINT32_MAX - b) return false;
    *out = a + b;
    return true;
}

}  // namespace lmk

#endif
