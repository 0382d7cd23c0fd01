// Export macro of the Word library: public classes and functions carry
// STYLES_WORD_API; everything else stays hidden.
#pragma once

#if defined(_WIN32)
#if defined(STYLES_WORD_BUILDING)
#define STYLES_WORD_API __declspec(dllexport)
#else
#define STYLES_WORD_API __declspec(dllimport)
#endif
#else
#define STYLES_WORD_API __attribute__((visibility("default")))
#endif
