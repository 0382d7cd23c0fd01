// Export macro of the style library: public classes and functions carry
// STYLES_API; everything else stays hidden.
#pragma once

#if defined(_WIN32)
#if defined(STYLES_BUILDING)
#define STYLES_API __declspec(dllexport)
#else
#define STYLES_API __declspec(dllimport)
#endif
#else
#define STYLES_API __attribute__((visibility("default")))
#endif
