// A check of the fuzz targets: a failed one prints the condition and aborts,
// which libFuzzer reports as a crash and keeps the input.
#pragma once

#include <cstdio>
#include <cstdlib>

#define FUZZ_CHECK(condition)                                                                      \
  ((condition)                                                                                     \
       ? (void)0                                                                                   \
       : (std::fprintf(stderr, "%s:%d: check failed: %s\n", __FILE__, __LINE__, #condition),       \
          std::abort()))
