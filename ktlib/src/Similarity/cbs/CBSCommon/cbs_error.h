// Error sink of the similarity building blocks. The blocks report what went
// wrong through cbs_error and return -1 (or a null pointer); the sink itself
// prints nothing, so a library build stays silent. A debugging build can set
// a breakpoint here to see every message with its source position.
#ifndef LUMICOR_KTLIB_CBS_ERROR_H
#define LUMICOR_KTLIB_CBS_ERROR_H

extern "C" void cbs_error(const char* file, int line, const char* format, ...);

#define CBS_ERROR(...) cbs_error(__FILE__, __LINE__, __VA_ARGS__)

#endif
