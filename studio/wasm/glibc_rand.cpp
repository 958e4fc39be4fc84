// rand() and srand() with the generator of the GNU C library (the additive feedback generator
// r[i] = r[i-3] + r[i-31] behind its default random()), replacing the C library's own in the
// WebAssembly build: the engine's white-noise sources call rand(), so the page's noise, like the
// rest of its output, equals the native library's on Debian bit for bit.
#include <cstdint>

namespace {

constexpr int kDegree = 31;
constexpr int kSeparation = 3;

struct AdditiveFeedback {
    int32_t r[kDegree] = {};
    int front = kSeparation;
    int rear = 0;

    explicit AdditiveFeedback(uint32_t seed) { reseed(seed); }

    void reseed(uint32_t seed) {
        if (seed == 0) seed = 1;
        r[0] = static_cast<int32_t>(seed);
        int32_t word = static_cast<int32_t>(seed);
        for (int i = 1; i < kDegree; ++i) {
            // 16807 * word % 2147483647 without overflowing 32 bits (Schrage's method).
            const int32_t hi = word / 127773;
            const int32_t lo = word % 127773;
            word = 16807 * lo - 2836 * hi;
            if (word < 0) word += 2147483647;
            r[i] = word;
        }
        front = kSeparation;
        rear = 0;
        for (int i = 0; i < 10 * kDegree; ++i) next();
    }

    int32_t next() {
        const uint32_t sum = static_cast<uint32_t>(r[front]) + static_cast<uint32_t>(r[rear]);
        r[front] = static_cast<int32_t>(sum);
        front = (front + 1) % kDegree;
        rear = (rear + 1) % kDegree;
        return static_cast<int32_t>(sum >> 1);
    }
};

AdditiveFeedback& generator() {
    static AdditiveFeedback g(1);  // an unseeded rand() behaves as after srand(1)
    return g;
}

}  // namespace

extern "C" int rand(void) {
    return generator().next();
}

extern "C" void srand(unsigned seed) {
    generator().reseed(seed);
}
