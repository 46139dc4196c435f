// Symbol visibility for the library: everything is hidden unless marked.
#pragma once

#if defined(VIRADUVE_BUILDING)
#define VIRADUVE_EXPORT __attribute__((visibility("default")))
#else
#define VIRADUVE_EXPORT
#endif
