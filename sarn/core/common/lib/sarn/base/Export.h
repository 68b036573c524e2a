// SARN_EXPORT marks what libsarn exports; everything else in the library is hidden.
#pragma once

#if defined(SARN_BUILDING_LIBRARY)
#define SARN_EXPORT __attribute__((visibility("default")))
#else
#define SARN_EXPORT __attribute__((visibility("default")))
#endif
