// Internal entry points of LmkConfig that are not part of the public header:
// loading the configuration from a memory buffer (used by the fuzz target so
// that it need not go through a file).
#ifndef LUMICOR_COMMON_CONFIG_LMK_CONFIG_INTERNAL_H
#define LUMICOR_COMMON_CONFIG_LMK_CONFIG_INTERNAL_H

#include <lumicor/lmk.h>

#include <cstddef>
#include <cstdint>

struct LmkConfigInternal {
    // Replaces the configuration by the lines in data[0, size), exactly as
    // LoadConfig does for a file. Returns 0; 2 when memory runs out (maps
    // left empty); 7 when the lock cannot be taken or size does not fit in
    // 32 bits.
    static uint32_t LoadConfigFromMemory(const uint8_t* data, size_t size);
};

#endif
