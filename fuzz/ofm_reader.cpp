// Fuzzes the OFM reader as the face section drives it: header, list sizes,
// regions prepared with CreateFaceRegion, entries; in the byte order the
// container's mark names. Whatever it accepts must be written back in a
// form that reads and writes again to the same bytes.
#include <lumicor/ofm.h>

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <new>
#include <vector>

namespace {

struct Meta {
    _FaceMeta m;
    Meta() { std::memset(static_cast<void*>(&m), 0, sizeof m); }
    ~Meta() { ReleaseFaceRegionArray(&m); }
};

bool Read(uint16_t order, const uint8_t* data, uint32_t size, Meta& out) {
    OfmHeader h;
    if (OFM_GetOfmHeader(order, data, size, &h) != 0) return false;
    const uint8_t* entries = data + h.headerSize;
    const uint32_t len = size - h.headerSize;
    uint8_t fixedBits[16], varBits[16];
    for (int i = 0; i < 16; ++i) {
        fixedBits[i] = h.fixedBits[i];
        varBits[i] = h.varBits[i];
    }
    uint16_t attributes, parts, feature;
    if (OFM_GetOfmSize(order, h.entrySize, h.fixedSize, h.faceNum, fixedBits, 16, varBits, 16, entries, len,
                       &attributes, &parts, &feature) != 0) {
        return false;
    }
    if (h.faceNum != 0) {
        uint16_t a, p, f;  // the first entry alone, through the single-entry query
        if (OFM_GetOfmDataSize(order, fixedBits, 16, varBits, 16, entries, h.entrySize, &a, &p, &f) != 0 ||
            a > attributes || p > parts || f > feature) {
            std::abort();
        }
        _FaceRegion* regions = new (std::nothrow) _FaceRegion[h.faceNum]();
        if (!regions) return false;
        out.m.pRegions = regions;
        out.m.regionCount = h.faceNum;
        for (uint32_t i = 0; i < h.faceNum; ++i) {
            if (CreateFaceRegion(attributes, parts, feature, &regions[i]) != 0) return false;
        }
    }
    return OFM_ParseOfm(&h, entries, len, &out.m) == 0;
}

bool Write(uint16_t order, const _FaceMeta& m, std::vector<uint8_t>& out) {
    uint32_t size = 0, written = 0;
    if (OFM_GetOfmBufferSize(m.pRegions, m.regionCount, 259, &size) != 0) return false;
    out.assign(size, 0);
    if (OFM_SerializeOfm(order, out.data(), size, &m, &written) != 0) return false;
    if (written != size) std::abort();
    return true;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size > UINT32_MAX) return 0;
    const uint16_t order = size >= 2 && data[0] == 'M' && data[1] == 'M' ? OFM_BYTE_ORDER_BIG : 0x4949;
    Meta first;
    if (!Read(order, data, static_cast<uint32_t>(size), first)) return 0;
    std::vector<uint8_t> once, twice, thrice;
    // A meta read from a container may still be unwritable (lists whose
    // maxima come from different faces can exceed the 16-bit entry size).
    if (!Write(order, first.m, once)) return 0;
    // The first write may still change the content (half a mouth becomes no
    // mouth, but its presence bit stays for that write); after it the form
    // must be stable.
    Meta second, third;
    if (!Read(order, once.data(), static_cast<uint32_t>(once.size()), second)) std::abort();
    if (!Write(order, second.m, twice)) std::abort();
    if (!Read(order, twice.data(), static_cast<uint32_t>(twice.size()), third)) std::abort();
    if (!Write(order, third.m, thrice) || thrice != twice) std::abort();
    return 0;
}
