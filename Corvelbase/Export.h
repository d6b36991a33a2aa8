// One macro marks what leaves the shared library; everything else is hidden.
#pragma once

#if defined(CORVEL_BUILDING_LIBRARY)
#define CORVEL_EXPORT __attribute__((visibility("default")))
#else
#define CORVEL_EXPORT
#endif
