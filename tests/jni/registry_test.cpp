// SPDX-License-Identifier: Apache-2.0
// The instance registry from both sides: its functions and teardown sweeps (including how they
// treat a busy registry lock); the Java lifecycle that uses it (load and unload hooks, instance
// creation and destruction, the life of the registry lock); and the serialisation of the Java
// calls on that lock, also while a deinit destroys it. Run under ThreadSanitizer as well.
#include <atomic>
#include <chrono>
#include <random>
#include <thread>

#include "jni/jni_internal.h"
#include "jni/jni_test_support.h"
#include "kova_host/audio_sink.h"

namespace {

using namespace jni_test;
using namespace std::chrono_literals;
using fake_jni::jbytes;

class Registry : public Loaded {
   protected:
    void SetUp() override {
        Loaded::SetUp();
        cap.clear();
    }
    kova_test::LogCapture cap;
};
using Locking = Registry;

jint set_volume(jlong id) {
    return JAVA(set_1volume, id, 0.5);
}

// Takes the engine context away from the instance in `slot` (freeing it).
void drop_context(int slot) {
    KovaInstance* inst = pKOVAInfo[slot].pInstance;
    ASSERT_EQ(kova_deinit(inst->pCtx), 0);
    inst->pCtx = nullptr;
}

// Frees a slot the teardowns cannot free (no context) together with its record.
void discard(int slot) {
    KovaInstance* inst = pKOVAInfo[slot].pInstance;
    _KovaInfoDelbyKova(inst);
    kova_mem_free(inst);
}

// Whether `lock` is free now (it is left as it was).
bool is_free(pthread_mutex_t* lock) {
    if (pthread_mutex_trylock(lock) != 0) return false;
    pthread_mutex_unlock(lock);
    return true;
}

// A lookup initialises an uninitialised registry first; after that only the in-use flag marks a
// slot taken, whatever its process id says.
TEST_F(Registry, LookupInitialisesFirstAndGoesByTheInUseFlag) {
    pKOVAInfoIsInited = 0;
    pKOVAInfo[0] = KovaInfo{5, nullptr, 1};  // what static memory would not hold
    EXPECT_EQ(_KovaInfoGetIndex(), 0);
    EXPECT_EQ(pKOVAInfo[0].isUsed, 0);
    pKOVAInfo[0] = KovaInfo{-1, nullptr, 1};
    pKOVAInfo[1] = KovaInfo{7, nullptr, 0};
    EXPECT_EQ(_KovaInfoGetIndex(), 1);
}

// The sweeps report every slot they reach, with the engine result of the sweep's last teardown
// for a slot they cannot free: the one for a process frees only that process's instances, the
// unload hook's every other one, and it leaves the registry lock alive and unlocked.
TEST_F(Registry, SweepsReportEverySlotWithTheLastEngineResult) {
    for (int i = 0; i < 5; ++i) ASSERT_EQ(init_default(), i + 1);
    pthread_mutex_t* lock = gpKovaMutex;
    for (int i : {0, 1, 2}) pKOVAInfo[i].pid = 4242;
    drop_context(0);  // before any teardown of the sweep: reports -3
    drop_context(4);  // after a success: reports 0
    KOVA_CTX* ok = pKOVAInfo[1].pInstance->pCtx;
    KOVA_CTX* refused = pKOVAInfo[2].pInstance->pCtx;
    refused->tag = 0;
    auto num = [](KOVA_CTX* c) { return std::to_string(reinterpret_cast<intptr_t>(c)); };
    cap.clear();
    _KovaInfoDelbyPid(4242);
    _KovaInfoDelbyPid(1);  // no such process: nothing at all
    EXPECT_EQ(
        jni_lines(cap),
        (Lines{"kova_deinit(pid) is failed. error=-3(sig)",
               "kova_deinit[1](id:" + num(ok) + "/pid:4242) is finished successfully(sig)",
               "kova_deinit[2](id:" + num(refused) + "/pid:4242) is already completed(sig)"}));
    EXPECT_EQ(pKOVAInfo[1].isUsed, 0);
    ASSERT_TRUE(pKOVAInfo[3].isUsed && pKOVAInfo[3].pInstance->pFastTrack);  // another process

    cap.clear();
    JNI_OnUnload(fake_jni::vm(), nullptr);
    EXPECT_EQ(jni_lines(cap),
              (Lines{"KOVA_JNI_OnUnload()", "_KovaInfoDelAll()",
                     "kova_deinit(pid) is failed. error=-3(all)",
                     "kova_deinit[2](pid:4242) is already completed(all)",
                     "kova_deinit[3](pid:" + kPid + ") is finished successfully(all)",
                     "kova_deinit(pid) is failed. error=0(all)"}));
    EXPECT_EQ(pKOVAInfo[3].isUsed, 0);
    for (int i : {0, 2, 4}) {
        ASSERT_EQ(pKOVAInfo[i].isUsed, 1);
        EXPECT_EQ(pKOVAInfo[i].pInstance->pFastTrack, nullptr);
    }
    EXPECT_EQ(gpKovaMutex, lock);
    EXPECT_TRUE(is_free(lock));
    refused->tag = KOVA_CTX_TAG;
    discard(0);
    discard(4);
}

// The sweeps go on when the registry lock is held elsewhere and never release it for its owner.
TEST_F(Registry, SweepsRunWithoutALockTheyCouldNotTake) {
    pthread_mutex_t* lock = gpKovaMutex;
    ASSERT_EQ(init_default(), 1);
    pthread_mutex_lock(lock);  // held by this very thread
    _KovaInfoDelAll();
    EXPECT_EQ(pKOVAInfo[0].isUsed, 0);
    EXPECT_FALSE(is_free(lock));
    pthread_mutex_unlock(lock);

    // No lock at all.
    ASSERT_EQ(init_default(), 1);
    ASSERT_EQ(init_default(), 2);
    ASSERT_EQ(deinit(2), 0);
    ASSERT_EQ(gpKovaMutex, nullptr);
    _KovaInfoDelAll();
    EXPECT_EQ(pKOVAInfo[0].isUsed, 0);
    EXPECT_EQ(gpKovaMutex, nullptr);
}

// A Java call waits for the registry lock held elsewhere (the volume tables touch no instance and
// do not wait). Queued there (it holds the gate and waits for the lock), it neither blocks a sweep
// nor has the lock released under it; it then finds its slot freed.
TEST_F(Locking, QueuedCallWaitsForTheLockAndDoesNotHoldUpASweep) {
    ASSERT_EQ(init_default(), 1);
    pthread_mutex_t* lock = gpKovaMutex;
    pthread_mutex_lock(lock);
    EXPECT_EQ(JAVA(get_1volumeTableSize, 1), 17);
    std::atomic<int> result{1};
    std::thread caller([&] { result = set_volume(1); });
    while (kova_jni::registry_gate().try_lock()) {  // until the caller holds the gate
        kova_jni::registry_gate().unlock();
        std::this_thread::yield();
    }
    std::this_thread::sleep_for(50ms);  // time for a caller that did not wait to run ahead
    EXPECT_EQ(result, 1);
    _KovaInfoDelAll();
    EXPECT_EQ(pKOVAInfo[0].isUsed, 0);
    EXPECT_EQ(result, 1);
    pthread_mutex_unlock(lock);
    caller.join();
    EXPECT_EQ(result, -3);
}

TEST_F(Registry, LoadHookCreatesLockAndRegistryOnceAndOnlyWithAnEnvironment) {
    reset_to_unloaded();
    fake_jni::g_getenv_result = JNI_EDETACHED;
    EXPECT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_ERR);
    EXPECT_EQ(gpKovaMutex, nullptr);
    EXPECT_EQ(pKOVAInfoIsInited, 0);
    fake_jni::g_getenv_result = JNI_OK;
    EXPECT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), 0x10006);
    pthread_mutex_t* lock = gpKovaMutex;
    ASSERT_NE(lock, nullptr);
    for (const KovaInfo& slot : pKOVAInfo) EXPECT_EQ(slot.pid, -1);

    // A second load keeps the lock and the slots.
    int marker = 0;
    ASSERT_EQ(_KovaInfoAdd(77, &marker), 0);
    EXPECT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), 0x10006);
    EXPECT_EQ(gpKovaMutex, lock);
    EXPECT_EQ(pKOVAInfo[0].pid, 77);
    EXPECT_EQ(jni_lines(cap), (Lines{"KOVA_JNI_OnLoad(init)", "KOVA_JNI_OnLoad()"}));
    _KovaInfoDelbyKova(&marker);
}

TEST_F(Registry, FailedInitReleasesEverythingAndLeavesNoSlot) {
    EXPECT_EQ(JAVA(init, 48000, 1, 1, 1080, 2280), -1);
    kova_host_fail_next_open(-19);
    EXPECT_EQ(init_default(), 0);

    // Memory running out before the engine gives 0; inside it (its last allocation is the
    // engine's), -1 with the engine's -2. The leak suite sweeps every allocation.
    const unsigned long before = kova_mem_alloc_count();
    ASSERT_EQ(init_default(), 1);
    const long made = static_cast<long>(kova_mem_alloc_count() - before);
    ASSERT_EQ(deinit(1), 0);
    ASSERT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_VERSION_1_6);
    for (long n : {0L, made - 1}) {
        kova_mem_fail_after(n);
        EXPECT_EQ(init_default(), n == 0 ? 0 : -1);
        kova_mem_fail_after(-1);
    }
    for (const KovaInfo& slot : pKOVAInfo) EXPECT_EQ(slot.isUsed, 0);
    const std::string init = "kova_init()", id1 = "kova_init(id:1,48000hz,2ch,p:1,w:1080,h:2280)";
    EXPECT_EQ(jni_lines(cap),
              (Lines{init, "kova_init() is failed. error=-1", init, init, id1, "kova_deinit()",
                     "kova_deinit(id:1, pid:" + kPid + ")", "KOVA_JNI_OnLoad()", init, init,
                     "kova_init() is failed. error=-2"}));

    // Without a lock and without memory, init fails and no lock appears.
    ASSERT_EQ(init_default(), 1);
    EXPECT_EQ(deinit(1), 0);
    kova_mem_fail_after(0);
    EXPECT_EQ(init_default(), 0);
    kova_mem_fail_after(-1);
    EXPECT_EQ(gpKovaMutex, nullptr);
}

TEST_F(Registry, RefusedTeardownsKeepTheSlot) {
    ASSERT_EQ(init_default(), 1);
    KovaInstance* inst = pKOVAInfo[0].pInstance;
    inst->pCtx->tag = 0;  // the engine no longer recognises the context
    cap.clear();
    EXPECT_EQ(deinit(1), -3);
    EXPECT_EQ(pKOVAInfo[0].pInstance, inst);
    EXPECT_EQ(inst->pFastTrack, nullptr);
    EXPECT_EQ(inst->pcm.data, nullptr);
    EXPECT_EQ(gpKovaMutex, nullptr);  // any deinit that finds an instance destroys the lock
    // Without its buffer the instance generates nothing; a call without a lock makes none.
    EXPECT_EQ(JAVA(gen_1tofasttrack, 1, 5, 5, 0, 0, 0), 0);
    EXPECT_EQ(gpKovaMutex, nullptr);
    inst->pCtx->tag = KOVA_CTX_TAG;
    EXPECT_EQ(deinit(1), 0);
    EXPECT_EQ(pKOVAInfo[0].isUsed, 0);

    EXPECT_EQ(jni_lines(cap), (Lines{"kova_deinit()", "kova_deinit(id:1) is already completed",
                                     "kova_deinit()", "kova_deinit(id:1, pid:" + kPid + ")"}));
    // The next init makes a fresh lock, created and left unlocked. (A teardown without engine
    // context: ApiContract's Java table.)
    ASSERT_EQ(init_default(), 1);
    ASSERT_NE(gpKovaMutex, nullptr);
    EXPECT_TRUE(is_free(gpKovaMutex));
}

// Owners create, use and destroy instances (each deinit destroys the registry lock) while other
// threads call methods on arbitrary ids. Every result must be a documented one, and the
// sanitizers must see no race and no use of a destroyed or freed mutex.
TEST_F(Locking, DeinitDestroyingTheLockStrandsNoCaller) {
    Sounds snd(4800, 38400, 4800);
    std::atomic<int> owners_left{3}, bad{0};
    auto expect_in = [&](int v, std::initializer_list<int> allowed) {
        if (std::find(allowed.begin(), allowed.end(), v) == allowed.end()) bad++;
    };
    std::vector<std::thread> threads;
    for (int o = 0; o < 3; ++o) {
        threads.emplace_back([&] {
            fake_jni::Array<jbyte> out(8192);
            for (int r = 0; r < 25; ++r) {
                const jlong id = init_default();
                expect_in(id >= 1 && id <= 20, {1});
                expect_in(reg(id, snd), {1});
                expect_in(JAVA(set_1src, id, 1), {0});
                JAVA(start_1fasttrack, id);
                for (int e = 0; e < 6; ++e) {
                    const int action = e == 0 ? 0 : e == 5 ? 2 : 1;
                    const float x = 10.f + 5 * e;
                    JAVA(gen_1tofasttrack, id, x, 10.f, 100 + 10 * e, 0, action);
                    JAVA(gen_1sounds, id, jbytes(out), x, 10.f, 100 + 10 * e, 0, action);
                }
                expect_in(set_volume(id), {0});
                JAVA(stop_1fasttrack, id);
                expect_in(deinit(id), {0});
            }
            owners_left--;
        });
    }
    for (int p = 0; p < 3; ++p) {
        threads.emplace_back([&, p] {
            std::mt19937 rng(p);
            fake_jni::Array<jbyte> out(4096);
            while (owners_left > 0) {
                const jlong id = static_cast<jlong>(rng() % 23) - 1;  // -1 .. 21
                expect_in(JAVA(get_1src_1num, id), {0, 1});
                expect_in(set_volume(id), {0, -3});
                const int n = JAVA(gen_1sounds, id, jbytes(out), 20, 20, 50, 0, 0);
                expect_in(n >= 0 && n <= 4096, {1});
                JAVA(stop_1fasttrack, id);
            }
        });
    }
    for (std::thread& t : threads) t.join();
    EXPECT_EQ(bad, 0);
    for (const KovaInfo& slot : pKOVAInfo) EXPECT_EQ(slot.isUsed, 0);
    EXPECT_EQ(gpKovaMutex, nullptr);  // the last deinit destroyed it
}

// An instance whose device has stalled (each burst takes 2.5 s to write) is torn down while
// another instance keeps calling: deinit holds the registry lock only for its bounded release of
// the device, so the other instance's call gets through well before the stalled write ends.
// (AddressSanitizer sees any use of the freed stream by the held-up thread.)
TEST_F(Locking, DeinitOfAStalledInstanceDoesNotHoldUpOthers) {
    kova_host_use_stall_sink(2500);
    ASSERT_EQ(init_default(), 1);
    kova_host_use_null_sink();
    ASSERT_EQ(init_default(), 2);
    JAVA(start_1fasttrack, 1);
    std::this_thread::sleep_for(50ms);  // the device thread is now inside its first write

    std::thread owner([&] { EXPECT_EQ(deinit(1), 0); });
    std::this_thread::sleep_for(20ms);  // let deinit take the registry lock
    const auto t0 = std::chrono::steady_clock::now();
    EXPECT_EQ(JAVA(get_1src_1num, 2), 0);
    EXPECT_LT(std::chrono::steady_clock::now() - t0, 1500ms);
    owner.join();
    EXPECT_EQ(kova_host_lingering_tracks(), 1u);  // released while its write still stalls
    EXPECT_EQ(deinit(2), 0);
    // The held-up thread ends on its own (bounded, so a broken release fails instead of hanging).
    for (int i = 0; i < 3000 && kova_host_lingering_tracks() != 0; ++i)
        std::this_thread::sleep_for(10ms);
    EXPECT_EQ(kova_host_lingering_tracks(), 0u);
}

}  // namespace
