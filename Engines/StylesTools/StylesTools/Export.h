// Export macro of the host toolkit: public classes and functions carry
// STYLES_TOOLS_API; everything else stays hidden.
#pragma once

#if defined(_WIN32)
#if defined(STYLES_TOOLS_BUILDING)
#define STYLES_TOOLS_API __declspec(dllexport)
#else
#define STYLES_TOOLS_API __declspec(dllimport)
#endif
#else
#define STYLES_TOOLS_API __attribute__((visibility("default")))
#endif
