// Activations of the face networks: one image, NHWC float32, and the arena
// that holds them. A network run is planned first (shapes only, no memory),
// then the arena is allocated once and the same code runs for real, so that
// no layer allocates.
#ifndef ORIEL_ENGINE_NN_TENSOR_H
#define ORIEL_ENGINE_NN_TENSOR_H

#include <cstddef>
#include <cstdint>
#include <cstdlib>

#include "common/src/internal/memory.h"

namespace oriel {
namespace nn {

struct Tensor {
    float* d = nullptr;  // null while planning
    int h = 0;
    int w = 0;
    int c = 0;
    size_t Size() const { return static_cast<size_t>(h) * static_cast<size_t>(w) * static_cast<size_t>(c); }
    float* At(int y, int x) const { return d + (static_cast<size_t>(y) * w + x) * c; }
};

// Fixed number of slots, each sized to the largest tensor placed in it
// during planning. Slot kPadSlot is the layers' own padding buffer.
class Arena {
public:
    static const int kSlots = 8;
    static const int kPadSlot = 0;

    Arena() : planning_(true) {
        for (int i = 0; i < kSlots; ++i) {
            need_[i] = 0;
            ptr_[i] = nullptr;
        }
    }

    bool Planning() const { return planning_; }

    // Returns a tensor of the given shape in slot s (null data while
    // planning). Shapes are small; callers check them for sanity first.
    Tensor Take(int s, int h, int w, int c) {
        Tensor t;
        t.h = h;
        t.w = w;
        t.c = c;
        const size_t n = t.Size();
        if (planning_) {
            if (n > need_[s]) need_[s] = n;
        } else {
            t.d = (n <= need_[s]) ? ptr_[s] : nullptr;
        }
        return t;
    }
    float* TakeRaw(int s, size_t n) {
        if (planning_) {
            if (n > need_[s]) need_[s] = n;
            return nullptr;
        }
        return n <= need_[s] ? ptr_[s] : nullptr;
    }

    // Ends planning: one allocation for every slot. False when out of memory.
    bool Allocate() {
        size_t total = 0;
        for (int i = 0; i < kSlots; ++i) {
            need_[i] = (need_[i] + 15) & ~static_cast<size_t>(15);
            if (need_[i] > (SIZE_MAX / sizeof(float)) - total - 16) return false;
            total += need_[i];
        }
        // Uninitialised: every layer writes its whole output before it is read.
        mem_.reset(static_cast<float*>(std::malloc((total + 16) * sizeof(float))));
        if (!mem_) return false;
        float* p = mem_.get();
        // 64-byte alignment for the vector kernels.
        while ((reinterpret_cast<uintptr_t>(p) & 63u) != 0) ++p;
        for (int i = 0; i < kSlots; ++i) {
            ptr_[i] = p;
            p += need_[i];
        }
        planning_ = false;
        return true;
    }

private:
    bool planning_;
    size_t need_[kSlots];
    float* ptr_[kSlots];
    lmk::MallocPtr<float> mem_;
};

}  // namespace nn
}  // namespace oriel

#endif
