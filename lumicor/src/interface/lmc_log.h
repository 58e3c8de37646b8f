// Logging of the exported interface: every message goes to the log under
// module and submodule "Lumicor", its format beginning with "%s(%d): " filled
// with this source file and line. Nothing is formatted unless the level is
// shown.
#ifndef LUMICOR_INTERFACE_LMC_LOG_H
#define LUMICOR_INTERFACE_LMC_LOG_H

#include <lumicor/lmk.h>

#define LMC_LOG(level, format, ...)                                                                  \
    do {                                                                                             \
        if (LmkLog::ShouldDisplay("Lumicor", "Lumicor", (level)))                                     \
            LmkLog::Log(__FILE__, __LINE__, "Lumicor", "Lumicor", (level), (format), __FILE__, __LINE__, \
                        ##__VA_ARGS__);                                                              \
    } while (0)

#define LMC_LOG_ERROR(format, ...) LMC_LOG(LMKLOG_ERROR, format, ##__VA_ARGS__)

#endif
