#pragma once

#include <cstdlib>
#include <new>

// Allocations of a test program that fail on demand. Included by one source
// file of the program: it replaces operator new.
namespace plr::test {

// How many more allocations of this thread succeed before one fails; negative:
// none fails. Negative again after that one.
inline thread_local int succeedingAllocations = -1;
// Allocations of this thread until now.
inline thread_local std::size_t allocations = 0;

}  // namespace plr::test

void* operator new(std::size_t size) {
    plr::test::allocations++;
    int& succeeding = plr::test::succeedingAllocations;
    if (succeeding >= 0 && succeeding-- == 0)
        throw std::bad_alloc();
    if (void* memory = std::malloc(size != 0 ? size : 1))
        return memory;
    throw std::bad_alloc();
}
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    try {
        return ::operator new(size);
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}
void operator delete(void* memory) noexcept {
    std::free(memory);
}
void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}
