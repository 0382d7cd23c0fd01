// Replaces the process's operator new and delete so that the bytes in use and
// their peak can be read around an operation. Include it in exactly one
// source file of a program.
#pragma once

#include <malloc.h>

#include <atomic>
#include <cstddef>
#include <cstdlib>
#include <new>

namespace {
std::atomic<std::size_t> g_bytesInUse{0};
std::atomic<std::size_t> g_peakBytes{0};

void* Allocate(std::size_t size) {
  void* memory = std::malloc(size ? size : 1);
  if (!memory)
    throw std::bad_alloc();
  const std::size_t now = g_bytesInUse += malloc_usable_size(memory);
  std::size_t peak = g_peakBytes.load(std::memory_order_relaxed);
  while (now > peak && !g_peakBytes.compare_exchange_weak(peak, now))
    ;
  return memory;
}
void Release(void* memory) noexcept {
  if (memory) {
    g_bytesInUse -= malloc_usable_size(memory);
    std::free(memory);
  }
}
} // namespace

void* operator new(std::size_t size) { return Allocate(size); }
void* operator new[](std::size_t size) { return Allocate(size); }
void operator delete(void* memory) noexcept { Release(memory); }
void operator delete[](void* memory) noexcept { Release(memory); }
void operator delete(void* memory, std::size_t) noexcept { Release(memory); }
void operator delete[](void* memory, std::size_t) noexcept { Release(memory); }
