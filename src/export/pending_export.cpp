// Placeholder until the export lands; deleted by its implementation.
#include <stdexcept>
#include "api/flows.h"
namespace viraduve {
namespace api {
int exportFlow(const char*, const char*, const char*, const char*, const char*, const char*, const char*, const char*, int, const char*, const char*, const char*, const char*) { throw std::logic_error("not implemented yet"); }
}  // namespace api
}  // namespace viraduve
