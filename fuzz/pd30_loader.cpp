// PD30 dictionary reader: any bytes either load into a dictionary that passes
// the structural checks, writes back to the same bytes and scans a small
// image without reading outside its buffers, or are refused without a leak.
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "oriel/src/pixdif/pixdif_data.h"
#include "oriel/src/pixdif/pixdif_detector.h"

using namespace orielcore_VA;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size > (1u << 20)) return 0;
    PixDifLoadStatus status;
    PixDifTreeData* d = PixDifTreeData_LoadFromMemory(data, static_cast<uint32_t>(size), &status);
    if (d == nullptr) return 0;
    if (!PixDifTreeData_Validate(d)) std::abort();
    const uint32_t n = PixDifTreeData_SerializedSize(d);
    std::vector<uint8_t> out(n);
    if (n == 0 || n > size || !PixDifTreeData_Save(d, out.data(), n)) std::abort();
    // A learner of type 12 reads no elements of its own; the rest round-trips.
    PixDifLoadStatus again;
    PixDifTreeData* d2 = PixDifTreeData_LoadFromMemory(out.data(), n, &again);
    if (d2 == nullptr) std::abort();
    std::vector<uint8_t> out2(n);
    if (!PixDifTreeData_Save(d2, out2.data(), n) || out2 != out) std::abort();
    PixDifTreeData_Delete(d2);
    {
        PixDifTreeDetector det;
        if (det.AttachData(d) && det.AllocateMemory(48, 40, d->learners[0].windowWidth, 64)) {
            std::vector<uint8_t> img(48 * 40);
            for (size_t i = 0; i < img.size(); ++i) img[i] = static_cast<uint8_t>(i * 29 + (i >> 5));
            det.stabilize = static_cast<int32_t>(size % 3);
            SPooledList list;
            det.CreateEmptyResultHolder(&list);
            det.EvalPixDifTreeMultiLayer(img.data(), 48, 40, 48, 1.0f, 0.841f, 0.0f, &list);
            list.Clear();
        }
    }
    PixDifTreeData_Delete(d);
    return 0;
}
