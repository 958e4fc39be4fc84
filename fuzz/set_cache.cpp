// SPDX-License-Identifier: Apache-2.0
#include "set_cache.h"

#include <cstring>

#include "fuzz_support.h"
#include "kova/kova_list.h"
#include "util/kova_mem.h"

namespace kova_fuzz {

namespace {

// Enough for the keys of the corpus entries libFuzzer mutates in turn; each holds up to about
// 800 KB.
constexpr size_t kMaxEntries = 48;

void keep_payload(void*) {}

// Keys are told apart by hash first: a string comparison that fails goes through the memcmp
// hook, and libFuzzer would learn the key bytes as input words.
uint64_t hash_of(const std::string& key) {
    uint64_t h = 14695981039346656037u;  // FNV-1a
    for (const char c : key) h = (h ^ static_cast<uint8_t>(c)) * 1099511628211u;
    return h;
}

}  // namespace

// A kept set and the images of everything an input can change in it.
struct SetCache::Entry {
    std::string key;
    uint64_t hash = 0;
    KOVA_SRCSET* set = nullptr;
    bool in_use = false;
    uint64_t last_used = 0;
    KOVA_SRCSET image{};
    KOVA_TUNE_SET tune{};
    std::vector<KOVA_FLT_DSC> filters;
    KOVA_SRC src[KOVA_SLOT_COUNT]{};
    std::vector<uint8_t> proc[KOVA_SLOT_COUNT];  // working copies as registration left them
};

SetCache::SetCache() = default;

SetCache::~SetCache() {
    for (const auto& e : entries_) {
        if (!e->in_use) kova_free_sourceset(e->set);
    }
}

int32_t SetCache::reuse(KOVA_CTX* ctx, const std::string& key) {
    LIST* sets = ctx->src_list;
    const uint64_t hash = hash_of(key);
    for (const auto& e : entries_) {
        if (e->hash != hash || e->key != key) continue;
        if (e->in_use || sets->count >= KOVA_MAX_SRCSETS) return 0;
        if (list_pushback(sets, e->set) == nullptr) return 0;
        e->in_use = true;
        e->last_used = ++clock_;
        ctx->active_src = static_cast<int32_t>(sets->count);
        return ctx->active_src;
    }
    return 0;
}

void SetCache::keep(KOVA_CTX* ctx, int32_t id, const std::string& key) {
    if (id < 1) return;
    const uint64_t hash = hash_of(key);
    for (const auto& e : entries_) {
        if (e->hash == hash && e->key == key)
            return;  // the kept one is in use: this set stays the input's own
    }
    std::unique_ptr<Entry> spare;
    if (entries_.size() >= kMaxEntries) {
        auto oldest = entries_.end();
        for (auto it = entries_.begin(); it != entries_.end(); ++it) {
            if (!(*it)->in_use &&
                (oldest == entries_.end() || (*it)->last_used < (*oldest)->last_used))
                oldest = it;
        }
        if (oldest == entries_.end()) return;
        kova_free_sourceset((*oldest)->set);
        spare = std::move(*oldest);  // its copies' memory serves the new set (no new pages)
        entries_.erase(oldest);
    }
    auto e = std::make_unique<Entry>();
    if (spare != nullptr) {
        for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) e->proc[slot].swap(spare->proc[slot]);
    }
    e->key = key;
    e->hash = hash;
    e->set =
        static_cast<KOVA_SRCSET*>(list_getat(ctx->src_list, static_cast<uint32_t>(id - 1))->data);
    e->in_use = true;
    e->last_used = ++clock_;
    e->image = *e->set;
    e->tune = *e->set->tune;
    for (NODE* n = e->set->filters->head->next; n != e->set->filters->tail; n = n->next)
        e->filters.push_back(*static_cast<const KOVA_FLT_DSC*>(n->data));
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        const KOVA_SRC* src = e->set->src[slot];
        if (src == nullptr) continue;
        e->src[slot] = *src;
        const auto* p = reinterpret_cast<const uint8_t*>(src->pcm_proc);
        e->proc[slot].clear();
        if (p != nullptr && src->size > 0) e->proc[slot].assign(p, p + src->size);
    }
    entries_.push_back(std::move(e));
}

void SetCache::release(KOVA_CTX* ctx) {
    LIST* sets = ctx->src_list;
    for (uint32_t i = sets->count; i-- > 0;) {
        const void* data = list_getat(sets, i)->data;
        for (auto it = entries_.begin(); it != entries_.end(); ++it) {
            Entry& e = **it;
            if (!e.in_use || e.set != data) continue;
            list_removeat(sets, i, keep_payload);
            e.in_use = false;
            // A set whose parts were replaced (a file set's sources are read again when its
            // filters change) is no longer the registered one: it is released.
            bool same = e.set->filters == e.image.filters && e.set->tune == e.image.tune;
            for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot)
                same = same && e.set->src[slot] == e.image.src[slot];
            if (same) {
                restore(e);
            } else {
                kova_free_sourceset(e.set);
                entries_.erase(it);
            }
            break;
        }
    }
    for (const auto& e : entries_) FUZZ_CHECK(!e->in_use);  // no operation removes a set
    edited_ = false;
}

void SetCache::restore(Entry& e) {
    KOVA_SRCSET* set = e.set;
    *set->tune = e.tune;
    set->thickness = e.image.thickness;
    LIST* filters = set->filters;
    bool filters_same = filters->count == e.filters.size();
    NODE* n = filters->head->next;
    for (size_t i = 0; filters_same && i < e.filters.size(); ++i, n = n->next)
        filters_same = std::memcmp(n->data, &e.filters[i], sizeof e.filters[i]) == 0;
    if (!filters_same) {
        while (filters->count > 0) list_removeat(filters, 0, kova_mem_free);
        for (const KOVA_FLT_DSC& d : e.filters) {
            auto* copy = static_cast<KOVA_FLT_DSC*>(kova_mem_malloc(sizeof d));
            FUZZ_CHECK(copy != nullptr);
            *copy = d;
            FUZZ_CHECK(list_pushback(filters, copy) != nullptr);
        }
    }
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        KOVA_SRC* src = set->src[slot];
        if (src == nullptr) continue;
        *src = e.src[slot];  // play position, repeat points
        if ((edited_ || !filters_same) && !e.proc[slot].empty())
            std::memcpy(src->pcm_proc, e.proc[slot].data(), e.proc[slot].size());
    }
}

}  // namespace kova_fuzz
