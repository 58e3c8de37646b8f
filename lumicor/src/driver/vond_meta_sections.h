// The three section writers of the photo meta blob as one table, so that the
// blob writer's own checks (sizes announced versus bytes written, the footer
// guard against a section that overruns its share) can be exercised with a
// deliberately faulty section. Production code always uses DefaultSections().
#ifndef LUMICOR_DRIVER_VOND_META_SECTIONS_H
#define LUMICOR_DRIVER_VOND_META_SECTIONS_H

#include <lumicor/vond.h>

namespace vond {

struct MetaSectionWriter {
    // Exact byte count the section writes, 0 when it cannot be computed.
    uint32_t (*size)(const _VondMeta& meta);
    _VondResult (*serialize)(const _VondMeta& meta, uint8_t* pBuf, uint32_t bufSize, uint32_t& written);
    const char* sizeFailedMessage;
};

struct MetaSections {
    MetaSectionWriter face;
    MetaSectionWriter quality;
    MetaSectionWriter attention;
};

const MetaSections& DefaultSections();

// VondSerializeMeta with the given section writers.
_VondResult SerializeMetaWith(const MetaSections& sections, const _VondMeta* pMeta, uint32_t bufSize,
                              uint8_t* pBuf);

}  // namespace vond

#endif
