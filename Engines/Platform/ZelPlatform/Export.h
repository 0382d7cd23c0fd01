// Export macro of the platform library: every class and function used across
// the shared-library boundary carries ZEL_API; everything else stays hidden.
#pragma once

#if defined(_WIN32)
#if defined(ZEL_PLATFORM_BUILDING)
#define ZEL_API __declspec(dllexport)
#else
#define ZEL_API __declspec(dllimport)
#endif
#else
#define ZEL_API __attribute__((visibility("default")))
#endif
