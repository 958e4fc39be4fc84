// SPDX-License-Identifier: Apache-2.0
// Source sets kept across the inputs of one fuzz target process. Registering a noise set makes
// and filters 96000 samples, a file set reads up to 270 KB back from disk: about a millisecond
// under the sanitizers, more than the rest of a typical input. A set's bytes depend only on what
// registered it (filter descriptor, file lengths and content, engine format; the noise on rand(),
// whose state is the process's anyway), so the first registration of a key runs the library's
// function and keeps the set; later inputs with the same key get that set appended to their
// context as registration would, and take it out again when they end, restored to the state
// right after registration.
#ifndef KOVA_FUZZ_SET_CACHE_H
#define KOVA_FUZZ_SET_CACHE_H

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "kova/kova.h"

namespace kova_fuzz {

class SetCache {
   public:
    SetCache();
    ~SetCache();
    SetCache(const SetCache&) = delete;
    SetCache& operator=(const SetCache&) = delete;

    // Appends the set kept for `key` to the context's list and makes it active, exactly as a
    // registration does. Returns its identifier, or 0 when none is kept, it is already in this
    // context or the context is full (the caller then registers the usual way).
    int32_t reuse(KOVA_CTX* ctx, const std::string& key);
    // Keeps the set the caller just registered as `id` under `key` (the least recently used
    // idle set makes room when the cache is full).
    void keep(KOVA_CTX* ctx, int32_t id, const std::string& key);
    // The filters of a set in the context may have changed: working copies are restored too.
    void edited() { edited_ = true; }
    // Takes every kept set out of the context's list and restores it. Called when an input ends,
    // before the context is reset.
    void release(KOVA_CTX* ctx);

   private:
    struct Entry;
    void restore(Entry& e);
    std::vector<std::unique_ptr<Entry>> entries_;
    uint64_t clock_ = 0;
    bool edited_ = false;
};

// A key part holding the bytes of a plain record.
template <typename T>
std::string key_bytes(const T& v) {
    return std::string(reinterpret_cast<const char*>(&v), sizeof v);
}

}  // namespace kova_fuzz

#endif
