// Byte-order writers shared by every serialiser and parser. The library only
// targets little-endian hosts (x86-64, ARM EABI), so "BE" means "reverse".
#include <lumicor/zbm_image.h>

#include <cstring>

static_assert(sizeof(uint32_t) == 4 && sizeof(uint64_t) == 8, "fixed widths");

namespace {

template <unsigned N>
uint32_t WriteSwapped(void* dst, const void* src) {
    const auto* s = static_cast<const uint8_t*>(src);
    uint8_t tmp[N];  // dst and src may overlap when a value is swapped in place
    for (unsigned i = 0; i < N; ++i) tmp[i] = s[N - 1 - i];
    std::memcpy(dst, tmp, N);
    return N;
}

template <unsigned N>
uint32_t WriteSame(void* dst, const void* src) {
    std::memmove(dst, src, N);
    return N;
}

uint32_t WriteNothing(void*, const void*) { return 0; }

using Writer = uint32_t (*)(void*, const void*);
const Writer kWriters16[3] = {WriteSame<2>, WriteSwapped<2>, WriteNothing};
const Writer kWriters32[3] = {WriteSame<4>, WriteSwapped<4>, WriteNothing};
const Writer kWriters64[3] = {WriteSame<8>, WriteSwapped<8>, WriteNothing};

uint32_t Dispatch(const Writer (&table)[3], void* dst, const void* src, _zbm_WriteEndianType type) {
    const unsigned t = static_cast<unsigned>(type);
    return t < 3 ? table[t](dst, src) : 0;
}

}  // namespace

extern "C" {

uint32_t zbm_Write8(void* dst, const void* src) { return WriteSame<1>(dst, src); }
uint32_t zbm_Write16BE(void* dst, const void* src) { return WriteSwapped<2>(dst, src); }
uint32_t zbm_Write32BE(void* dst, const void* src) { return WriteSwapped<4>(dst, src); }
uint32_t zbm_Write64BE(void* dst, const void* src) { return WriteSwapped<8>(dst, src); }
uint32_t zbm_Write16LE(void* dst, const void* src) { return WriteSame<2>(dst, src); }
uint32_t zbm_Write32LE(void* dst, const void* src) { return WriteSame<4>(dst, src); }
uint32_t zbm_Write64LE(void* dst, const void* src) { return WriteSame<8>(dst, src); }
uint32_t zbm_Write16(void* dst, const void* src, _zbm_WriteEndianType type) { return Dispatch(kWriters16, dst, src, type); }
uint32_t zbm_Write32(void* dst, const void* src, _zbm_WriteEndianType type) { return Dispatch(kWriters32, dst, src, type); }
uint32_t zbm_Write64(void* dst, const void* src, _zbm_WriteEndianType type) { return Dispatch(kWriters64, dst, src, type); }

}  // extern "C"
