// Fuzz target: CASearchFraming on hostile parameters and area arrays.
//
// Input (big-endian): flags u8; width, height u32; composition_mode i32,
// aspect_ratio, magnification_limit, consistency_weight_min f32,
// force_main_number i32; isFace, numAreas u32; then up to 16 area records
// (nx, ny, nw, nh f32, val i32), missing bytes read as 0.
// Flags: 1 null param, 2 null array, 4 null result, 8 null records,
// 16 take the sizes as given (else 240 + size % 20000), 32 start from the
// defaults and set only the host's three fields.
//
// The call must return, and its result must be a proper crop on 0 and be
// left alone on a refusal or an allocation failure.
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstring>

#include <lumicor/calib.h>

#include "common/src/internal/byte_cursor.h"

namespace {

FILE* g_quiet = nullptr;

bool Fraction(float v) { return v >= 0.0f && v <= 1.0f; }

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size > 4096) return 0;
    if (g_quiet == nullptr) g_quiet = std::fopen("/dev/null", "w");
    lmk::ByteReader in(data, static_cast<uint32_t>(size));
    const uint8_t flags = in.U8();
    uint32_t width = in.U32();
    uint32_t height = in.U32();
    if (!(flags & 16)) {
        width = 240 + width % 20000;
        height = 240 + height % 20000;
    }
    _CAParam param;
    param.composition_mode = in.I32();
    param.aspect_ratio = in.F32();
    param.magnification_limit = in.F32();
    param.consistency_weight_min = in.F32();
    param.force_main_number = in.I32();
    if (flags & 32) {
        const _CAParam host = param;
        CAGetDefaultParam(&param);
        param.composition_mode = host.composition_mode;
        param.aspect_ratio = host.aspect_ratio;
        param.magnification_limit = host.magnification_limit;
    }
    // The library reads at most 16 records whatever the count says.
    CAAttentionArea records[16];
    _CAAttentionAreaArray array;
    array.isFace = in.U32();
    array.numAreas = in.U32();
    for (CAAttentionArea& r : records) {
        r.nx = in.F32();
        r.ny = in.F32();
        r.nw = in.F32();
        r.nh = in.F32();
        r.val.direction = in.I32();
    }
    array.pAreaArray = (flags & 8) ? nullptr : records;

    const _CAResult untouched = {-2.0f, -2.0f, -2.0f, -2.0f};
    _CAResult result = untouched;
    // Keep the library's diagnostics out of the fuzzer's log; sanitizer
    // reports go to the file descriptor and are not affected.
    FILE* const saved = stderr;
    if (g_quiet != nullptr) stderr = g_quiet;
    const uint32_t code = CASearchFraming(width, height, (flags & 1) ? nullptr : &param,
                                          (flags & 2) ? nullptr : &array,
                                          (flags & 4) ? nullptr : &result);
    stderr = saved;

    if (code == 0) {
        if (!Fraction(result.x) || !Fraction(result.y) || !Fraction(result.width) ||
            !Fraction(result.height) || result.width <= 0.0f || result.height <= 0.0f) {
            __builtin_trap();
        }
    } else if (code == 3 || code == 4) {
        if (std::memcmp(&result, &untouched, sizeof result) != 0) __builtin_trap();
    } else if (code != 12) {
        __builtin_trap();
    }
    return 0;
}
