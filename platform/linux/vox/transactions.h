#pragma once

#include <cstdint>

// The process's transactions, and what its leaving waits for besides.
//
// Threads: any.
// Cost:    a transaction is two counts of one word.
namespace vox_link {

// How many transactions ever began, modulo 2^32: it changes when one comes and goes.
[[nodiscard]] std::uint32_t transactions_begun() noexcept;

}  // namespace vox_link
