#ifndef LUMICOR_VOND_RESULT_H
#define LUMICOR_VOND_RESULT_H
#include <lumicor/vond.h>
namespace vond {
inline _VondResult Begin(const char* function) { return _VondResult{0, function, nullptr}; }
inline _VondResult Fail(_VondResult r, uint32_t status, const char* message) { r.status = status; r.message = message; return r; }
}  // namespace vond
#endif
