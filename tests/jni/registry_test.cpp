// SPDX-License-Identifier: Apache-2.0
/* The instance registry from both sides: its functions and teardown sweeps (including how they
 * treat a busy registry lock), and the Java lifecycle that uses it: load and unload hooks,
 * instance creation and destruction, and the life of the registry lock. */
#include <errno.h>

#include <atomic>
#include <thread>

#include "jni/jni_internal.h"
#include "jni/jni_test_support.h"
#include "kova_host/audio_sink.h"

namespace {

using namespace jni_test;
using Registry = Loaded;

TEST(RegistrySlots, IndexAddAndDelbyKova) {
    reset_to_unloaded();
    kova_test::LogCapture cap;
    pKOVAInfo[3] = KovaInfo{5, nullptr, 0};  // what static memory would not hold
    EXPECT_EQ(_KovaInfoGetIndex(), 0);
    EXPECT_EQ(pKOVAInfoIsInited, 1);
    EXPECT_EQ(pKOVAInfo[3].pid, -1);

    // Adding to an uninitialised registry initialises it first.
    pKOVAInfoIsInited = 0;
    int a = 0, b = 0;
    EXPECT_EQ(_KovaInfoAdd(10, &a), 0);
    for (int i = 1; i < 20; ++i) EXPECT_EQ(_KovaInfoAdd(10 + i, i % 2 ? &b : &a), i);
    EXPECT_EQ(pKOVAInfo[19].pid, 29);
    EXPECT_EQ(_KovaInfoGetIndex(), -1);
    EXPECT_EQ(_KovaInfoAdd(99, &a), -1);
    EXPECT_EQ(pKOVAInfo[0].pid, 10);
    EXPECT_EQ(jni_lines(cap), (Lines{"KOVA instance MAX", "KOVA instance MAX"}));

    // Only isUsed decides whether a slot is free.
    pKOVAInfo[7].isUsed = 0;
    EXPECT_EQ(_KovaInfoGetIndex(), 7);
    _KovaInfoDelbyKova(&b);  // slots 1, 3, ..., 19; slot 7 is not in use and stays as it is
    for (int i = 0; i < 20; ++i) {
        if (i == 7) {
            EXPECT_EQ(pKOVAInfo[i].pInstance, reinterpret_cast<KovaInstance*>(&b));
        } else if (i % 2) {
            EXPECT_EQ(pKOVAInfo[i].pid, -1) << i;
            EXPECT_EQ(pKOVAInfo[i].pInstance, nullptr) << i;
        } else {
            EXPECT_EQ(pKOVAInfo[i].pInstance, reinterpret_cast<KovaInstance*>(&a)) << i;
        }
    }
    _KovaInfoDelbyKova(&a);
    EXPECT_EQ(_KovaInfoGetIndex(), 0);
    reset_to_unloaded();
}

TEST_F(Registry, DelAllReportsEverySlotWithTheLastEngineResult) {
    for (int i = 0; i < 4; ++i) ASSERT_EQ(init_default(), i + 1);
    drop_context(1);                        // after a success: reports 0
    pKOVAInfo[2].pInstance->pCtx->tag = 0;  // refused
    drop_context(3);                        // after the refusal: reports -3
    kova_test::LogCapture cap;
    _KovaInfoDelAll();
    EXPECT_EQ(jni_lines(cap),
              (Lines{"_KovaInfoDelAll()",
                     "kova_deinit[0](pid:" + kPid + ") is finished successfully(all)",
                     "kova_deinit(pid) is failed. error=0(all)",
                     "kova_deinit[2](pid:" + kPid + ") is already completed(all)",
                     "kova_deinit(pid) is failed. error=-3(all)"}));
    EXPECT_EQ(pKOVAInfo[0].isUsed, 0);
    for (int i = 1; i < 4; ++i) {
        ASSERT_EQ(pKOVAInfo[i].isUsed, 1);
        EXPECT_EQ(pKOVAInfo[i].pInstance->pFastTrack, nullptr);
        EXPECT_EQ(pKOVAInfo[i].pInstance->pcm.data, nullptr);
    }
    pKOVAInfo[2].pInstance->pCtx->tag = KOVA_CTX_TAG;
    discard(1);
    discard(3);
}

TEST_F(Registry, DelbyPidSweepsOnlyThatProcess) {
    for (int i = 0; i < 4; ++i) ASSERT_EQ(init_default(), i + 1);
    for (int i : {0, 1, 2}) pKOVAInfo[i].pid = 4242;
    drop_context(0);  // before any engine call: reports -3
    KOVA_CTX* ok = pKOVAInfo[1].pInstance->pCtx;
    KOVA_CTX* refused = pKOVAInfo[2].pInstance->pCtx;
    refused->tag = 0;
    auto num = [](KOVA_CTX* c) { return std::to_string(reinterpret_cast<intptr_t>(c)); };

    kova_test::LogCapture cap;
    _KovaInfoDelbyPid(4242);
    EXPECT_EQ(
        jni_lines(cap),
        (Lines{"kova_deinit(pid) is failed. error=-3(sig)",
               "kova_deinit[1](id:" + num(ok) + "/pid:4242) is finished successfully(sig)",
               "kova_deinit[2](id:" + num(refused) + "/pid:4242) is already completed(sig)"}));
    EXPECT_EQ(pKOVAInfo[1].isUsed, 0);
    EXPECT_EQ(pKOVAInfo[2].isUsed, 1);
    ASSERT_EQ(pKOVAInfo[3].isUsed, 1);  // another process id: untouched
    EXPECT_NE(pKOVAInfo[3].pInstance->pFastTrack, nullptr);
    EXPECT_NE(pKOVAInfo[3].pInstance->pcm.data, nullptr);

    cap.clear();
    _KovaInfoDelbyPid(1);  // no such process: nothing at all
    EXPECT_TRUE(jni_lines(cap).empty());
    refused->tag = KOVA_CTX_TAG;
    discard(0);
}

/* The sweeps go on when the registry lock is held elsewhere and never release it for its owner. */
TEST_F(Registry, SweepsRunWithoutALockTheyCouldNotTake) {
    pthread_mutex_t* lock = gpKovaMutex;

    // Held by this very thread.
    ASSERT_EQ(init_default(), 1);
    pthread_mutex_lock(lock);
    _KovaInfoDelAll();
    EXPECT_EQ(pKOVAInfo[0].isUsed, 0);
    EXPECT_EQ(pthread_mutex_trylock(lock), EBUSY);
    pthread_mutex_unlock(lock);

    // Held by another thread.
    ASSERT_EQ(init_default(), 1);
    pKOVAInfo[0].pid = 4242;
    std::atomic<int> stage{0};
    std::thread holder([&] {
        pthread_mutex_lock(lock);
        stage = 1;
        while (stage != 2) std::this_thread::yield();
        pthread_mutex_unlock(lock);
    });
    while (stage != 1) std::this_thread::yield();
    _KovaInfoDelbyPid(4242);
    EXPECT_EQ(pKOVAInfo[0].isUsed, 0);
    EXPECT_EQ(pthread_mutex_trylock(lock), EBUSY);
    stage = 2;
    holder.join();

    // Free: taken and given back.
    EXPECT_EQ(pthread_mutex_trylock(lock), 0);
    pthread_mutex_unlock(lock);
    _KovaInfoDelAll();
    EXPECT_EQ(pthread_mutex_trylock(lock), 0);
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

/* A Java call queued behind the registry (it holds the gate and waits for the lock) neither blocks
 * a sweep nor has the lock released under it; it then finds its slot freed. */
TEST_F(Registry, SweepDoesNotWaitForAQueuedCall) {
    ASSERT_EQ(init_default(), 1);
    pthread_mutex_t* lock = gpKovaMutex;
    pthread_mutex_lock(lock);
    std::atomic<int> result{1};
    std::thread caller([&] {
        result = Java_com_corvane_audio_Kova_set_1volume(fake_jni::env(), nullptr, 1, 0.5);
    });
    // Once the gate is taken, the caller is inside the frame and waits for `lock`.
    for (;;) {
        if (!kova_jni::registry_gate().try_lock()) break;
        kova_jni::registry_gate().unlock();
        std::this_thread::yield();
    }
    _KovaInfoDelAll();
    EXPECT_EQ(pKOVAInfo[0].isUsed, 0);
    EXPECT_EQ(result, 1);
    pthread_mutex_unlock(lock);
    caller.join();
    EXPECT_EQ(result, -3);
}

class Lifecycle : public Loaded {
   protected:
    void SetUp() override {
        Loaded::SetUp();
        cap.clear();
    }
    kova_test::LogCapture cap;
};

TEST(JniLoad, LoadHookCreatesLockAndRegistryOnceAndOnlyWithAnEnvironment) {
    reset_to_unloaded();
    kova_test::LogCapture cap;
    fake_jni::g_getenv_result = JNI_EDETACHED;
    EXPECT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_ERR);
    EXPECT_EQ(gpKovaMutex, nullptr);
    EXPECT_EQ(pKOVAInfoIsInited, 0);
    EXPECT_EQ(pKOVAInfo[0].pid, 0);
    EXPECT_TRUE(jni_lines(cap).empty());

    fake_jni::g_getenv_result = JNI_OK;
    EXPECT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), 0x10006);
    ASSERT_NE(gpKovaMutex, nullptr);
    EXPECT_EQ(pKOVAInfoIsInited, 1);
    for (const KovaInfo& slot : pKOVAInfo) {
        EXPECT_EQ(slot.pid, -1);
        EXPECT_EQ(slot.pInstance, nullptr);
        EXPECT_EQ(slot.isUsed, 0);
    }
    EXPECT_EQ(jni_lines(cap), Lines{"KOVA_JNI_OnLoad(init)"});

    // A second load keeps the lock and the slots.
    pthread_mutex_t* lock = gpKovaMutex;
    int marker = 0;
    ASSERT_EQ(_KovaInfoAdd(77, &marker), 0);
    cap.clear();
    EXPECT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), 0x10006);
    EXPECT_EQ(gpKovaMutex, lock);
    EXPECT_EQ(pKOVAInfo[0].pid, 77);
    EXPECT_EQ(pKOVAInfo[0].pInstance, reinterpret_cast<KovaInstance*>(&marker));
    EXPECT_EQ(jni_lines(cap), Lines{"KOVA_JNI_OnLoad()"});
    _KovaInfoDelbyKova(&marker);
    reset_to_unloaded();
}

TEST_F(Lifecycle, InitFillsTheFirstFreeSlotAndDeinitFreesIt) {
    EXPECT_EQ(init_default(), 1);
    EXPECT_EQ(init_default(), 2);
    const KovaInfo& slot = pKOVAInfo[0];
    EXPECT_EQ(slot.pid, getpid());
    EXPECT_EQ(slot.isUsed, 1);
    ASSERT_NE(slot.pInstance, nullptr);
    const KovaInstance& inst = *slot.pInstance;
    EXPECT_NE(inst.pCtx, nullptr);
    EXPECT_NE(inst.pFastTrack, nullptr);
    EXPECT_EQ(inst.pFastTrack->state, 0);  // left stopped
    EXPECT_NE(inst.pcm.data, nullptr);
    EXPECT_EQ(inst.pcm.size, 960000);
    EXPECT_EQ(inst.curSrc, 0);
    EXPECT_EQ(inst.format.sample_rate, 48000u);
    EXPECT_EQ(inst.format.h, 2280u);
    EXPECT_EQ(jni_lines(cap),
              (Lines{"kova_init()", "kova_init(id:1,48000hz,2ch,p:1,w:1080,h:2280)", "kova_init()",
                     "kova_init(id:2,48000hz,2ch,p:1,w:1080,h:2280)"}));

    cap.clear();
    EXPECT_EQ(deinit(1), 0);
    EXPECT_EQ(jni_lines(cap), (Lines{"kova_deinit()", "kova_deinit(id:1, pid:" + kPid + ")"}));
    EXPECT_EQ(pKOVAInfo[0].isUsed, 0);
    EXPECT_EQ(pKOVAInfo[0].pid, -1);
    EXPECT_EQ(init_default(), 1);
}

TEST_F(Lifecycle, DeinitOfBadIdsAndFreeSlotsKeepsTheLock) {
    ASSERT_EQ(init_default(), 1);
    pthread_mutex_t* lock = gpKovaMutex;
    cap.clear();
    for (jlong id : {0L, -5L, 21L}) EXPECT_EQ(deinit(id), -3) << id;
    EXPECT_EQ(jni_lines(cap), (Lines{"kova_deinit()", "kova_deinit()", "kova_deinit()"}));
    cap.clear();
    EXPECT_EQ(deinit(2), 0);
    EXPECT_EQ(jni_lines(cap), (Lines{"kova_deinit()", "instance is NULL. deinit() is failed."}));
    EXPECT_EQ(gpKovaMutex, lock);

    // A deinit that finds an instance destroys the lock; calls without a lock do not create one.
    EXPECT_EQ(deinit(1), 0);
    EXPECT_EQ(gpKovaMutex, nullptr);
    EXPECT_EQ(deinit(1), 0);
    EXPECT_EQ(Java_com_corvane_audio_Kova_set_1volume(fake_jni::env(), nullptr, 1, 0.5), -3);
    EXPECT_EQ(gpKovaMutex, nullptr);
    EXPECT_EQ(init_default(), 1);
    ASSERT_NE(gpKovaMutex, nullptr);
    EXPECT_EQ(pthread_mutex_trylock(gpKovaMutex), 0);  // created unlocked, left unlocked
    pthread_mutex_unlock(gpKovaMutex);
}

TEST_F(Lifecycle, FailedInitReleasesEverythingAndLeavesNoSlot) {
    EXPECT_EQ(Java_com_corvane_audio_Kova_init(fake_jni::env(), nullptr, 48000, 1, 1, 1080, 2280),
              -1);
    EXPECT_EQ(jni_lines(cap), (Lines{"kova_init()", "kova_init() is failed. error=-1"}));

    cap.clear();
    kova_host_fail_next_open(-19);
    EXPECT_EQ(init_default(), 0);
    EXPECT_EQ(jni_lines(cap), Lines{"kova_init()"});

    // Memory running out before the engine gives 0; inside it (its last allocation is the
    // engine's), -1 with the engine's -2. The leak suite sweeps every allocation.
    const unsigned long before = kova_mem_alloc_count();
    ASSERT_EQ(init_default(), 1);
    const long made = static_cast<long>(kova_mem_alloc_count() - before);
    ASSERT_EQ(deinit(1), 0);
    ASSERT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_VERSION_1_6);
    for (long n : {0L, made - 1}) {
        cap.clear();
        kova_mem_fail_after(n);
        const jlong id = init_default();
        kova_mem_fail_after(-1);
        EXPECT_EQ(id, n == 0 ? 0 : -1);
        EXPECT_EQ(jni_lines(cap), n == 0
                                      ? Lines{"kova_init()"}
                                      : (Lines{"kova_init()", "kova_init() is failed. error=-2"}));
        for (const KovaInfo& slot : pKOVAInfo) ASSERT_EQ(slot.isUsed, 0) << n;
    }
    ASSERT_EQ(init_default(), 1);

    // Without a lock and without memory, init fails and no lock appears.
    EXPECT_EQ(deinit(1), 0);
    kova_mem_fail_after(0);
    EXPECT_EQ(init_default(), 0);
    kova_mem_fail_after(-1);
    EXPECT_EQ(gpKovaMutex, nullptr);
}

TEST_F(Lifecycle, RefusedTeardownsKeepTheSlot) {
    ASSERT_EQ(init_default(), 1);
    KovaInstance* inst = pKOVAInfo[0].pInstance;
    inst->pCtx->tag = 0;  // the engine no longer recognises the context
    cap.clear();
    EXPECT_EQ(deinit(1), -3);
    EXPECT_EQ(jni_lines(cap), (Lines{"kova_deinit()", "kova_deinit(id:1) is already completed"}));
    EXPECT_EQ(pKOVAInfo[0].isUsed, 1);
    EXPECT_EQ(pKOVAInfo[0].pInstance, inst);
    EXPECT_EQ(inst->pFastTrack, nullptr);
    EXPECT_EQ(inst->pcm.data, nullptr);
    EXPECT_EQ(inst->pcm.size, 960000);
    EXPECT_NE(inst->pCtx, nullptr);
    EXPECT_EQ(gpKovaMutex, nullptr);
    // Without its buffer the instance generates nothing.
    EXPECT_EQ(
        Java_com_corvane_audio_Kova_gen_1tofasttrack(fake_jni::env(), nullptr, 1, 5, 5, 0, 0, 0),
        0);

    inst->pCtx->tag = KOVA_CTX_TAG;
    cap.clear();
    EXPECT_EQ(deinit(1), 0);
    EXPECT_EQ(jni_lines(cap), (Lines{"kova_deinit()", "kova_deinit(id:1, pid:" + kPid + ")"}));
    EXPECT_EQ(pKOVAInfo[0].isUsed, 0);

    // Without an engine context the teardown reports it and keeps the slot as well.
    ASSERT_EQ(init_default(), 1);
    inst = pKOVAInfo[0].pInstance;
    drop_context(0);
    cap.clear();
    EXPECT_EQ(deinit(1), -3);
    EXPECT_EQ(jni_lines(cap), (Lines{"kova_deinit()", "kova_deinit() is failed. error=-3"}));
    EXPECT_EQ(pKOVAInfo[0].pInstance, inst);
    EXPECT_EQ(inst->pFastTrack, nullptr);
    EXPECT_EQ(gpKovaMutex, nullptr);
    discard(0);
}

/* The unload hook runs the teardown of every slot (whose lines and refusals the registry tests
 * check in full), and leaves the lock alive and unlocked. */
TEST_F(Lifecycle, UnloadTearsDownEveryInstanceAndKeepsTheLock) {
    ASSERT_EQ(init_default(), 1);
    pthread_mutex_t* lock = gpKovaMutex;
    cap.clear();
    JNI_OnUnload(fake_jni::vm(), nullptr);
    EXPECT_EQ(jni_lines(cap),
              (Lines{"KOVA_JNI_OnUnload()", "_KovaInfoDelAll()",
                     "kova_deinit[0](pid:" + kPid + ") is finished successfully(all)"}));
    EXPECT_EQ(pKOVAInfo[0].isUsed, 0);
    EXPECT_EQ(gpKovaMutex, lock);
    EXPECT_EQ(pthread_mutex_trylock(lock), 0);
    pthread_mutex_unlock(lock);
}

}  // namespace
