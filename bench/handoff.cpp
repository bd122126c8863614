// What it takes to hand a cache line from one CPU to the other: two threads that count up one word in turns. Contended
// figures are only comparable beside it. Prints nanoseconds.
#include <atomic>
#include <chrono>
#include <cstdio>
#include <thread>

int main()
{
    constexpr unsigned turns = 2'000'000;
    std::atomic<unsigned> word = 0;
    const auto count = [&word](unsigned parity) {
        for (unsigned turn = parity; turn < turns; turn += 2) {
            while (word.load(std::memory_order_acquire) != turn) {
            }
            word.store(turn + 1, std::memory_order_release);
        }
    };
    const auto begin = std::chrono::steady_clock::now();
    std::thread other(count, 1U);
    count(0);
    other.join();
    const std::chrono::duration<double, std::nano> passed = std::chrono::steady_clock::now() - begin;
    std::printf("%.1f\n", passed.count() / turns);
    return 0;
}
