#include "ktlib/src/Similarity/cbs/CBSCommon/cbs_error.h"

extern "C" void cbs_error(const char* file, int line, const char* format, ...) {
    (void)file;
    (void)line;
    (void)format;
}
