/* Serialisation of the Java calls: the registry lock is held by every instance method, and deinit
 * destroying that lock while other threads are calling in leaves none of them with a dead mutex.
 * Run under ThreadSanitizer and AddressSanitizer builds as well. */
#include <atomic>
#include <chrono>
#include <random>
#include <thread>

#include "jni/jni_test_support.h"
#include "kova_host/audio_sink.h"

namespace {

using fake_jni::env;
using jni_test::deinit;
using jni_test::init_default;
using Locking = jni_test::Loaded;

/* A method waits for the registry lock held elsewhere: it cannot reach the registry before the
 * holder lets go. (The pause only gives a wrong implementation time to run ahead.) */
TEST_F(Locking, InstanceMethodsWaitForTheRegistryLock) {
    ASSERT_EQ(init_default(), 1);
    pthread_mutex_t* lock = gpKovaMutex;
    pthread_mutex_lock(lock);
    std::atomic<bool> done{false};
    std::thread caller([&] {
        Java_com_corvane_audio_Kova_get_1src_1num(env(), nullptr, 1);
        done = true;
    });
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
    EXPECT_FALSE(done);
    pthread_mutex_unlock(lock);
    caller.join();
    EXPECT_TRUE(done);

    // The volume tables touch no instance and do not wait.
    pthread_mutex_lock(lock);
    EXPECT_EQ(Java_com_corvane_audio_Kova_get_1volumeTableSize(env(), nullptr, 1), 17);
    pthread_mutex_unlock(lock);
}

/* Owners create, use and destroy instances (each deinit destroys the registry lock) while other
 * threads call every method on arbitrary ids. Every result must be a documented one, and the
 * sanitizers must see no race and no use of a destroyed or freed mutex. */
TEST_F(Locking, DeinitDestroyingTheLockStrandsNoCaller) {
    jni_test::PcmFiles files;
    fake_jni::String loop{files.write("loop.pcm", 38400, 220)};
    fake_jni::String start{files.write("start.pcm", 4800, 880)};
    constexpr int kOwners = 3;
    constexpr int kPokers = 3;
    constexpr int kRounds = 25;
    std::atomic<int> owners_left{kOwners};
    std::atomic<int> bad{0};
    auto expect_in = [&](int v, std::initializer_list<int> allowed) {
        if (std::find(allowed.begin(), allowed.end(), v) == allowed.end()) bad++;
    };

    std::vector<std::thread> threads;
    for (int o = 0; o < kOwners; ++o) {
        threads.emplace_back([&] {
            fake_jni::Array<jbyte> out(8192);
            for (int r = 0; r < kRounds; ++r) {
                const jlong id = init_default();
                if (id < 1 || id > 20) {
                    bad++;
                    continue;
                }
                expect_in(
                    Java_com_corvane_audio_Kova_reg_1src_1byfiles(
                        env(), nullptr, id, fake_jni::jstr(start), fake_jni::jstr(loop), nullptr),
                    {1});
                expect_in(Java_com_corvane_audio_Kova_set_1src(env(), nullptr, id, 1), {0});
                Java_com_corvane_audio_Kova_start_1fasttrack(env(), nullptr, id);
                jlong t = 100;
                for (int e = 0; e < 6; ++e, t += 10) {
                    const int action = e == 0 ? 0 : e == 5 ? 2 : 1;
                    Java_com_corvane_audio_Kova_gen_1tofasttrack(env(), nullptr, id, 10.f + 5 * e,
                                                                 10.f, t, 0, action);
                    Java_com_corvane_audio_Kova_gen_1sounds(env(), nullptr, id,
                                                            fake_jni::jbytes(out), 10.f + 5 * e,
                                                            10.f, t, 0, action);
                }
                expect_in(Java_com_corvane_audio_Kova_set_1volume(env(), nullptr, id, 0.7), {0});
                Java_com_corvane_audio_Kova_stop_1fasttrack(env(), nullptr, id);
                expect_in(deinit(id), {0});
            }
            owners_left--;
        });
    }
    for (int p = 0; p < kPokers; ++p) {
        threads.emplace_back([&, p] {
            std::mt19937 rng(p);
            fake_jni::Array<jbyte> out(4096);
            fake_jni::Array<jfloat> spk(17), hs(17);
            while (owners_left > 0) {
                const jlong id = static_cast<jlong>(rng() % 23) - 1;  // -1 .. 21
                expect_in(Java_com_corvane_audio_Kova_get_1src_1num(env(), nullptr, id), {0, 1});
                expect_in(Java_com_corvane_audio_Kova_set_1volume(env(), nullptr, id, 0.9),
                          {0, -3});
                expect_in(Java_com_corvane_audio_Kova_set_1thickness(env(), nullptr, id, 0.3),
                          {0, -3});
                const int n = Java_com_corvane_audio_Kova_gen_1sounds(
                    env(), nullptr, id, fake_jni::jbytes(out), 20, 20, 50, 0, 0);
                expect_in(n >= 0 && n <= 4096 ? 0 : 1, {0});
                Java_com_corvane_audio_Kova_stop_1fasttrack(env(), nullptr, id);
                Java_com_corvane_audio_Kova_get_1volumeTable(env(), nullptr, fake_jni::jfloats(spk),
                                                             fake_jni::jfloats(hs));
            }
        });
    }
    for (std::thread& t : threads) t.join();

    EXPECT_EQ(bad, 0);
    for (const KovaInfo& slot : pKOVAInfo) EXPECT_EQ(slot.isUsed, 0);
    EXPECT_EQ(gpKovaMutex, nullptr);  // the last deinit destroyed it
    EXPECT_EQ(init_default(), 1);
    EXPECT_NE(gpKovaMutex, nullptr);
}

/* An instance whose device has stalled (each burst takes 2.5 s to write) is torn down while
 * another instance keeps calling: deinit holds the registry lock only for its bounded release of
 * the device, so the other instance's call gets through well before the stalled write ends. */
TEST_F(Locking, DeinitOfAStalledInstanceDoesNotHoldUpOthers) {
    using namespace std::chrono_literals;
    kova_host_use_stall_sink(2500);
    const jlong stalled = init_default();
    kova_host_use_null_sink();
    const jlong other = init_default();
    ASSERT_EQ(stalled, 1);
    ASSERT_EQ(other, 2);
    Java_com_corvane_audio_Kova_start_1fasttrack(env(), nullptr, stalled);
    std::this_thread::sleep_for(50ms);  // the device thread is now inside its first write

    std::atomic<bool> torn_down{false};
    std::thread owner([&] {
        EXPECT_EQ(deinit(stalled), 0);
        torn_down = true;
    });
    std::this_thread::sleep_for(20ms);  // let deinit take the registry lock
    const auto t0 = std::chrono::steady_clock::now();
    EXPECT_EQ(Java_com_corvane_audio_Kova_get_1src_1num(env(), nullptr, other), 0);
    EXPECT_LT(std::chrono::steady_clock::now() - t0, 1500ms);
    owner.join();
    EXPECT_TRUE(torn_down);
    EXPECT_EQ(deinit(other), 0);

    const auto give_up = std::chrono::steady_clock::now() + 10s;
    while (kova_host_lingering_tracks() != 0 && std::chrono::steady_clock::now() < give_up) {
        std::this_thread::sleep_for(10ms);
    }
    EXPECT_EQ(kova_host_lingering_tracks(), 0u);
}

}  // namespace
