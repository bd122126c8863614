// Plain words that threads, or processes, share without a lock.
//
// The stop switch, level bytes, list links that look-ups follow and the header words shared with readers of the file
// are plain members of plain structures. They are read and written only through these helpers, which cost what a plain
// access costs and tell the compiler, and a race detector, that the sharing is meant.
#pragma once

#include <atomic>
#include <type_traits>

namespace qn::tr
{
template <class T>
inline T load_relaxed(const T &word)
{
    return __atomic_load_n(&word, __ATOMIC_RELAXED);
}

template <class T>
inline void store_relaxed(T &word, std::type_identity_t<T> value)
{
    __atomic_store_n(&word, value, __ATOMIC_RELAXED);
}

// For a link: what it leads to was written before.
template <class T>
inline T load_acquire(const T &word)
{
    return __atomic_load_n(&word, __ATOMIC_ACQUIRE);
}

template <class T>
inline void store_release(T &word, std::type_identity_t<T> value)
{
    __atomic_store_n(&word, value, __ATOMIC_RELEASE);
}

// Between two stores into a trace file whose order matters to whoever reads it after the process was killed: keeps the
// compiler from exchanging them. x86-64 does not exchange stores by itself.
inline void keep_store_order() { std::atomic_signal_fence(std::memory_order_seq_cst); }
} // namespace qn::tr
